// A file as questions about meaning need it: its bytes, its names and its syntax, read in one go.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "lines/source_text.h"
#include "names/bindings.h"
#include "syntax/syntax.h"

namespace quillet {

using FileId = uint32_t;
inline constexpr FileId kNoFile = UINT32_MAX;

class SourceFile {
 public:
  FileId id = kNoFile;
  std::string path;
  Ref<SourceText> source;
  Bindings bindings;
  FileSyntax syntax;
  bool is_stub = false;
  bool is_python2 = false;

  Text text() const { return source->text(); }

  // The occurrences of each symbol; made when first asked for.
  const OccurrencesOfSymbols& occurrences() const;

  // The occurrence that begins at an offset, and the one in whose extent it lies or that ends there;
  // kNoIndex without one. Logarithmic.
  uint32_t OccurrenceBeginningAt(uint32_t offset) const;
  uint32_t OccurrenceAt(uint32_t offset) const;

  // The innermost scope whose body an offset lies in; on a line of its own between statements its column decides.
  uint32_t ScopeAt(uint32_t offset) const;
  // That of the place where an expression begins, remembered.
  uint32_t ScopeAround(ExprId expr) const;
  // The scope that a `def`, a `class`, a lambda or a comprehension opens; kNoIndex without one. A scope of type
  // parameters around it is its parent.
  uint32_t ScopeOfStmt(StmtId stmt) const;
  uint32_t ScopeOfExpr(ExprId expr) const;
  // What opens a scope: kModuleStmt for the module and for what no statement opens, kNoExpr likewise.
  StmtId StmtOfScope(uint32_t scope) const;
  ExprId ExprOfScope(uint32_t scope) const;

  // Line from 1 and column from 1 in bytes, as in Occurrence of the host; and back, held to the source's extent.
  Position PlaceOf(uint32_t offset) const;
  uint32_t OffsetOf(int line, int column) const;

  size_t ByteSize() const;

 private:
  void MapScopes() const;
  uint32_t ScopeBeginningAt(uint32_t offset, NameScopeKind kind) const;
  uint32_t FindScopeOfExpr(ExprId number) const;
  uint32_t ExprScopeAt(uint32_t offset) const;
  uint32_t ColumnOf(uint32_t offset) const;

  mutable std::unique_ptr<OccurrencesOfSymbols> occurrences_;
  mutable std::vector<uint32_t> scopes_by_begin_;  // of definitions, lambdas and comprehensions
  mutable std::vector<StmtId> stmt_of_scope_;
  mutable std::vector<ExprId> expr_of_scope_;
  mutable std::vector<uint32_t> scopes_around_;  // of expressions; kNoIndex where it was not asked for
  mutable bool has_maps_ = false;
};

}  // namespace quillet
