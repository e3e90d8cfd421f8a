// The statements and expressions of a source as plain text, to be held against what the language's own parser
// says, and to be looked at.
#include <string>
#include <vector>

#include "bindings/bindings.h"
#include "bindings/convert.h"
#include "bindings/interpreter_lock.h"
#include "names/binder.h"
#include "syntax/reader.h"

namespace quillet::host {

namespace {

void AppendNumbers(std::string& text, std::initializer_list<uint32_t> numbers) {
  for (const uint32_t number : numbers) text.append(" ").append(std::to_string(number));
}

void AppendIds(std::string& text, std::span<const ExprId> ids) {
  for (const ExprId id : ids) text.append(" ").append(std::to_string(id));
}

// A line each: of the expressions, of the statements, and of the names that the binder knows and the tree does
// not.
std::string SyntaxLines(const SourceText& source, std::span<const LineRow> rows, Version version) {
  FileSyntax file;
  SyntaxReader(version).Read(source, rows, file);
  std::string text;
  for (const Expr& expr : file.exprs) {
    text.append("E ").append(WordOf(expr.kind));
    AppendNumbers(text, {expr.op, expr.flags, expr.begin, expr.end, expr.name_begin, expr.name_end, expr.parent});
    AppendIds(text, file.ChildrenOf(expr));
    text += '\n';
  }
  for (const Stmt& stmt : file.stmts) {
    text.append("S ").append(WordOf(stmt.kind));
    AppendNumbers(text,
                  {stmt.op, stmt.flags, stmt.begin, stmt.end, stmt.block_end, stmt.parent, stmt.first_child, stmt.next,
                   stmt.hint, stmt.name_begin, stmt.name_end, stmt.decorator_count, stmt.type_parameter_count});
    AppendIds(text, file.ExprsOf(stmt));
    text += '\n';
  }
  NameBinder binder(version);
  const Bindings& bindings = binder.Bind(source, rows);
  text.append("B ").append(std::to_string(bindings.occurrences.size())).append("\n");
  for (const Occurrence& occurrence : bindings.occurrences) {
    if (file.NamedAt(occurrence.begin) != kNoExpr || file.StatementNamedAt(occurrence.begin) != kModuleStmt) continue;
    text += 'N';
    AppendNumbers(text, {occurrence.begin, bindings.EndOf(occurrence), occurrence.flags});
    text += '\n';
  }
  return text;
}

}  // namespace

void BindSyntax(nb::module_& tarvex) {
  nb::module_ host = SiblingModule(tarvex, "host");
  host.def(
      "SyntaxLines",
      [](Any version_triple, Any bytes) {
        const HostText text = HostText::FromBytes(bytes);
        const Version version = VersionOf(version_triple);
        std::string lines;
        {
          const Unlocked unlocked;
          const Ref<SourceText> source = SourceText::Copy(text.text());
          std::vector<LineRow> rows;
          CutLinesCompletely(*source, version, rows);
          lines = SyntaxLines(*source, rows, version);
        }
        return StrOf(lines);
      },
      nb::arg("version"), nb::arg("source"),
      "The statements and expressions of a source, a line each: kind, numbers, and those in it; for tests.");
}

}  // namespace quillet::host
