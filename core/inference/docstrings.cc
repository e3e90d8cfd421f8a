// What docstrings say of types, in the fields that people write there: `:type x: int`, `@rtype: str`, `x : int` in a
// section of parameters. Nobody checks them, so what they say is a guess.
#include <algorithm>
#include <array>

#include "inference/inference.h"

namespace quillet {

namespace {

Text Trimmed(Text text) {
  const size_t begin = text.find_first_not_of(" \t\r`*");
  if (begin == Text::npos) return {};
  return text.substr(begin, text.find_last_not_of(" \t\r`*.") - begin + 1);
}

bool IsDotted(Text text) {
  return !text.empty() && text.front() != '.' && std::ranges::all_of(text, [](char c) {
    return std::isalnum(static_cast<unsigned char>(c)) != 0 || c == '_' || c == '.';
  });
}

// Words that people write for types.
Text NameOfWord(Text word) {
  static constexpr std::array<std::pair<Text, Text>, 9> kWords{{{"string", "str"},
                                                                {"strings", "str"},
                                                                {"integer", "int"},
                                                                {"boolean", "bool"},
                                                                {"dictionary", "dict"},
                                                                {"ints", "int"},
                                                                {"floats", "float"},
                                                                {"number", "float"},
                                                                {"callable", "object"}}};
  for (const auto& [written, name] : kWords)
    if (written == word) return name;
  return word;
}

}  // namespace

Value Inference::ValueOfWords(const SourceFile& file, Text words, int depth) {
  static constexpr int kMaxNesting = 4;
  static constexpr size_t kMaxWords = 200;
  words = Trimmed(words);
  if (words.empty() || depth > kMaxNesting || words.size() > kMaxWords) return kUnknownValue;
  // Alternatives at the outermost level.
  int brackets = 0;
  for (size_t i = 0; i < words.size(); ++i) {
    if (words[i] == '[' || words[i] == '(' || words[i] == '{') ++brackets;
    if (words[i] == ']' || words[i] == ')' || words[i] == '}') --brackets;
    if (brackets != 0) continue;
    const size_t size = words.substr(i).starts_with(" or ")  ? 4
                        : words.substr(i).starts_with(" | ") ? 3
                        : words[i] == '|' || words[i] == ',' ? 1
                                                             : 0;
    if (size == 0) continue;
    const Value left = ValueOfWords(file, words.substr(0, i), depth + 1);
    const Text rest = Trimmed(words.substr(i + size));
    if (rest == "optional" || rest.starts_with("default")) return left;
    return types_.Union(left, ValueOfWords(file, rest, depth + 1));
  }
  if (words.front() == '(' && words.back() == ')') {
    std::vector<TypeSetId> items;
    Text rest = words.substr(1, words.size() - 2);
    while (!rest.empty()) {
      const size_t comma = std::min(rest.find(','), rest.size());
      if (!Trimmed(rest.substr(0, comma)).empty())
        items.push_back(ValueOfWords(file, rest.substr(0, comma), depth + 1).Packed());
      rest.remove_prefix(std::min(comma + 1, rest.size()));
    }
    return Just(types_.Add(TypeKind::kTuple, 0, 0, items), Value::kGuessed | Value::kOpen);
  }
  const size_t of = words.find(" of "), open = words.find('[');
  if (of != Text::npos || (open != Text::npos && words.back() == ']')) {
    const bool is_subscript = of == Text::npos;
    Value container = ValueOfWords(file, words.substr(0, is_subscript ? open : of), depth + 1);
    const Value items = ValueOfWords(
        file, is_subscript ? words.substr(open + 1, words.size() - open - 2) : words.substr(of + 4), depth + 1);
    std::vector<TypeId> made;
    for (const TypeId id : types_.CopyOf(container.set)) {
      if (types_[id].kind != TypeKind::kInstance) continue;
      const std::vector<TypeSetId> args(std::max<size_t>(InfoOf(types_[id].a).parameters.size(), 1), items.Packed());
      made.push_back(InstanceOf(types_[id].a, args));
    }
    container.set = types_.SetOf(made);
    return container;
  }
  if (words == "None") return NoneValue();
  for (const Text prefix : {Text(":class:"), Text("~"), Text("a "), Text("an ")})
    if (words.starts_with(prefix)) return ValueOfWords(file, words.substr(prefix.size()), depth + 1);
  const Text name = NameOfWord(words);
  if (!IsDotted(name)) return kUnknownValue;
  // A name of the file or of the language, or a module and what it has.
  Value value;
  const size_t dot = name.find('.');
  const Text first = name.substr(0, dot);
  const ModuleId own = modules_.OfFile(file.id);
  if (own != kNoModule) {
    for (const Entity& entity : EntitiesInFile(own, file.id, first).found)
      value = types_.Union(value, ValueOfEntity(entity));
  }
  if (!value.IsKnown()) value = BuiltinNamed(first);
  if (!value.IsKnown()) {
    const ModuleId module = modules_.Find(first);
    if (module != kNoModule) value = Just(types_.Add(TypeKind::kModule, module));
  }
  for (size_t at = dot; at != Text::npos && value.IsKnown();) {
    const size_t next = name.find('.', at + 1);
    const Text part = name.substr(at + 1, next == Text::npos ? next : next - at - 1);
    value = AttributeOf(value, NameOfNumber(NumberOfName(part)));
    at = next;
  }
  Value made{kNoTypes, Value::kGuessed | Value::kOpen};
  for (const TypeId id : types_.CopyOf(value.set)) {
    if (types_[id].kind == TypeKind::kClass) made.set = types_.Union(made.set, types_.SetOf(InstanceOf(types_[id].a)));
    if (types_[id].kind == TypeKind::kModule) made.set = types_.Union(made.set, types_.SetOf(id));
  }
  return made;
}

// Of a parameter, or of the result for an empty name.
Value Inference::ValueInDocstring(const FunctionInfo& info, Text name) {
  const SourceFile* file = FileOf(info.file);
  if (info.lambda != kNoExpr || file == nullptr) return kUnknownValue;
  const FileSyntax& syntax = file->syntax;
  const auto docstring_of = [&](StmtId owner) -> Text {
    const StmtId first = syntax.stmt(owner).first_child;
    if (first == kModuleStmt || syntax.stmt(first).kind != StmtKind::kExpression) return {};
    const auto exprs = syntax.ExprsOf(syntax.stmt(first));
    if (exprs.size() != 1 || syntax[exprs[0]].kind != ExprKind::kString) return {};
    const Text text = syntax.TextOf(syntax[exprs[0]]);
    return text.substr(0, text.find_last_not_of("'\"") + 1);
  };
  Text text = docstring_of(info.stmt);
  // A class says in its own what its constructor takes.
  if (info.cls != kNoId && syntax.NameOf(syntax.stmt(info.stmt)) == "__init__" && !name.empty() &&
      text.find(name) == Text::npos)
    text = docstring_of(classes_[info.cls].stmt);
  if (text.empty()) return kUnknownValue;
  const auto line_behind = [&](const std::string& field) -> Text {
    for (size_t at = text.find(field); at != Text::npos; at = text.find(field, at + 1)) {
      const size_t begin = at + field.size();
      return text.substr(begin, std::min(text.find('\n', begin), text.size()) - begin);
    }
    return {};
  };
  Text words;
  if (name.empty()) {
    for (const char* field : {":rtype:", "@rtype:"})
      if (words.empty()) words = line_behind(field);
    if (words.empty()) {  // a section of results: its first line, up to a colon
      for (const Text head : {Text("Returns\n"), Text("Yields\n")}) {
        size_t at = text.find(head);
        if (at == Text::npos) continue;
        at = text.find('\n', at + head.size());  // behind the rule
        if (at == Text::npos || text.substr(0, at).find_last_of('-') == Text::npos) continue;
        const Text line = Trimmed(text.substr(at + 1, std::min(text.find('\n', at + 1), text.size()) - at - 1));
        const size_t colon = line.find(" : ");
        words = colon == Text::npos ? line : line.substr(colon + 3);
      }
    }
  } else {
    const std::string own(name);
    for (const std::string& field : {":type " + own + ":", "@type " + own + ":"})
      if (words.empty()) words = line_behind(field);
    if (words.empty()) {  // `:param int x:`
      for (size_t at = text.find(":param "); at != Text::npos && words.empty(); at = text.find(":param ", at + 1)) {
        const size_t end = text.find(':', at + 1);
        if (end == Text::npos) break;
        const Text inside = Trimmed(text.substr(at + 7, end - at - 7));
        if (inside.ends_with(" " + own)) words = inside.substr(0, inside.size() - own.size() - 1);
      }
    }
    if (words.empty()) words = line_behind("\n" + own + " : ");
    for (size_t at = text.find(own + " : "); at != Text::npos && words.empty(); at = text.find(own + " : ", at + 1)) {
      // At the beginning of its line, in a list of names or alone.
      const size_t line = text.substr(0, at).find_last_of('\n') + 1;
      if (Trimmed(text.substr(line, at - line)).empty())
        words = text.substr(at + own.size() + 3, std::min(text.find('\n', at), text.size()) - at - own.size() - 3);
    }
    for (size_t at = text.find(own + " ("); at != Text::npos && words.empty(); at = text.find(own + " (", at + 1)) {
      const size_t line = text.substr(0, at).find_last_of('\n') + 1;
      const size_t end = text.find("):", at);
      if (Trimmed(text.substr(line, at - line)).empty() && end != Text::npos)
        words = text.substr(at + own.size() + 2, end - at - own.size() - 2);
    }
  }
  Value value = words.empty() ? kUnknownValue : ValueOfWords(*file, words);
  value.doubt |= Value::kGuessed | Value::kOpen;
  return value;
}

}  // namespace quillet
