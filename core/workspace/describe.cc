// Types, signatures and documentation as text.
#include <algorithm>
#include <cctype>
#include <tuple>

#include "program/blanks.h"
#include "tokens/token_ends.h"
#include "workspace/workspace_impl.h"

namespace quillet {

// What holds the same sets many times over, one in another, is put together of the texts of those.
std::string Workspace::Impl::TextOfSet(TypeSetId set, bool is_short, int depth) {
  const std::tuple key(set, is_short, depth);
  if (const auto known = texts_of_sets_.find(key); known != texts_of_sets_.end()) return known->second;
  std::string text = FindTextOfSet(set, is_short, depth);
  texts_of_sets_.emplace(key, text);
  return text;
}

std::string Workspace::Impl::FindTextOfSet(TypeSetId set, bool is_short, int depth) {
  if (WithoutOpen(set) == kNoTypes) return is_short ? "Any" : "typing.Any";
  std::vector<std::string> parts;
  bool has_none = false;
  for (const TypeId id : inference.types().CopyOf(set)) {
    if (inference.types()[id].kind == TypeKind::kNone) {
      has_none = true;
      continue;
    }
    if (inference.types()[id].kind == TypeKind::kForeign) continue;
    std::string text = TextOfType(id, is_short, depth + 1);
    if (std::ranges::find(parts, text) == parts.end()) parts.push_back(std::move(text));
  }
  std::ranges::sort(parts);
  parts.erase(std::unique(parts.begin(), parts.end()), parts.end());
  if (has_none) parts.push_back("None");
  if (parts.empty()) return is_short ? "Any" : "typing.Any";
  std::string text;
  for (const std::string& part : parts) {
    if (!text.empty()) text += " | ";
    text += parts.size() > 1 && part.starts_with("def ") ? "(" + part + ")" : part;
  }
  return text;
}

std::string Workspace::Impl::TextOfType(TypeId id, bool is_short, int depth) {
  static constexpr int kMaxNesting = 6;
  if (depth > kMaxNesting) return "...";
  const Type t = inference.types()[id];
  const auto name_of = [&](ClassId cls) {
    return is_short ? std::string(inference.InfoOf(cls).name) : inference.QualifiedName(cls);
  };
  const auto args = [&](size_t from) {
    std::string text;
    for (size_t i = from; i < t.args_count; ++i) {
      if (i > from) text += ", ";
      text += TextOfSet(inference.types().ArgOf(id, i), is_short, depth + 1);
    }
    return text;
  };
  const auto with_args = [&](std::string name) {
    bool has_any = false;
    for (size_t i = 0; i < t.args_count; ++i)
      has_any = has_any || WithoutOpen(inference.types().ArgOf(id, i)) != kNoTypes;
    return has_any ? name + "[" + args(0) + "]" : name;
  };
  switch (t.kind) {
    case TypeKind::kNone:
      return "None";
    case TypeKind::kModule:
      return "module " + modules[t.a].name;
    case TypeKind::kClass:
      return "type[" + with_args(name_of(t.a)) + "]";
    case TypeKind::kInstance:
      if (inference.InfoOf(t.a).name == "property") return name_of(t.a);
      return with_args(name_of(t.a)) + (inference.InfoOf(t.a).name == "tuple" && t.args_count == 1 ? "" : "");
    case TypeKind::kTuple: {
      const std::string name = is_short ? "tuple" : "builtins.tuple";
      return t.args_count == 0 ? name + "[()]" : name + "[" + args(0) + "]";
    }
    case TypeKind::kFunction:
      return TextOfFunction(t.a, t.args_count > 0, false, is_short, depth);
    case TypeKind::kTypeVar: {
      const SourceFile* file = Get(t.a);
      if (file == nullptr) return "TypeVar";
      if (file->syntax[t.b].kind == ExprKind::kTypeParameter) return std::string(file->syntax.NameOf(t.b));
      const ExprId first = file->syntax.ChildOf(t.b, 1);
      const Text text = first == kNoExpr ? Text() : file->syntax.TextOf(file->syntax[first]);
      return text.size() > 2 ? std::string(text.substr(1, text.size() - 2)) : "TypeVar";
    }
    case TypeKind::kSuper:
      return TextOfSet(inference.types().ArgOf(id, 0), is_short, depth + 1);
    case TypeKind::kSpecial:
      switch (static_cast<SpecialForm>(t.a)) {
#define QUILLET_SPECIAL_FORM(identifier, name) \
  case SpecialForm::k##identifier:             \
    return (is_short ? "" : "typing.") + std::string(name);
#include "inference/special_forms.def"
        default:
          return "typing.Any";
      }
    case TypeKind::kTypeForm:
      return "type[" + TextOfSet(inference.types().ArgOf(id, 0), is_short, depth + 1) + "]";
    case TypeKind::kForeign:
      return std::string(inference.NameOfNumber(t.a));
    case TypeKind::kCallable:
      return "def (" + (t.b == 1 ? args(1) : std::string("...")) + ") -> " +
             TextOfSet(inference.types().ArgOf(id, 0), is_short, depth + 1);
  }
  return {};
}

std::vector<TypeId> Workspace::Impl::InOrder(TypeSetId set) {
  struct Keyed {
    std::string path;
    uint32_t offset = 0;
    std::string text;
    TypeId type;
  };
  std::vector<Keyed> keyed;
  for (const TypeId type : inference.types().CopyOf(set)) {
    Keyed& key = keyed.emplace_back();
    key.type = type;
    if (inference.types().SizeOf(set) == 1) break;
    key.text = TextOfType(type);
    const Type t = inference.types()[type];
    const auto place = [&](FileId id, StmtId stmt, ExprId expr) {
      const SourceFile* file = Get(id);
      key.path = files.PathOf(id);
      if (file != nullptr) key.offset = expr != kNoExpr ? file->syntax[expr].begin : file->syntax.stmt(stmt).begin;
    };
    if (t.kind == TypeKind::kFunction) {
      const FunctionInfo info = inference.function(t.a);
      place(info.file, info.stmt, info.lambda);
    } else if (t.kind == TypeKind::kInstance || t.kind == TypeKind::kClass) {
      const ClassInfo& info = inference.InfoOf(t.a);
      place(info.file, info.stmt, info.call);
    }
  }
  std::ranges::stable_sort(keyed, {}, [](const Keyed& key) { return std::tie(key.path, key.offset, key.text); });
  std::vector<TypeId> types;
  for (const Keyed& key : keyed) types.push_back(key.type);
  return types;
}

std::vector<std::string> Workspace::Impl::TextsOf(Value value, bool is_short) {
  std::vector<std::string> texts;
  for (const TypeId id : inference.types().CopyOf(inference.WithoutForeign(value).set)) {
    std::string text = TextOfType(id, is_short);
    if (std::ranges::find(texts, text) == texts.end()) texts.push_back(std::move(text));
  }
  std::ranges::sort(texts);
  return texts;
}

namespace {

// What a signature says of a parameter or a result: that builtins are builtins goes without saying there.
std::string WithoutBuiltins(std::string text) {
  static constexpr Text kPrefix = "builtins.";
  for (size_t at = 0; (at = text.find(kPrefix, at)) != std::string::npos;) {
    const bool is_whole = at == 0 || (text[at - 1] != '.' && text[at - 1] != '_' &&
                                      !std::isalnum(static_cast<unsigned char>(text[at - 1])));
    if (is_whole)
      text.erase(at, kPrefix.size());
    else
      at += kPrefix.size();
  }
  return text;
}

}  // namespace

std::string Workspace::Impl::TextOfParameter(const FunctionInfo& info, size_t index, bool is_short) {
  const SourceFile* file = Get(info.file);
  const FileSyntax& syntax = file->syntax;
  const ExprId parameter = inference.ParametersOf(info)[index];
  const auto kind = static_cast<ParameterKind>(syntax[parameter].op);
  std::string text;
  if (kind == ParameterKind::kBareStar) return "*";
  if (kind == ParameterKind::kSlash) return "/";
  if (kind == ParameterKind::kStar) text = "*";
  if (kind == ParameterKind::kDoubleStar) text = "**";
  text += syntax.NameOf(parameter);
  const ExprId hint = inference.HintOfParameter(*file, info, index), otherwise = syntax.ChildOf(parameter, 1);
  static constexpr size_t kMaxText = 60;
  if (hint != kNoExpr) {
    const Text as_written = syntax.TextOf(syntax[hint]);
    text += ": ";
    text += is_short ? std::string(as_written)
                     : WithoutBuiltins(TextOfSet(inference.ValueOfHint(info.file, hint).set, false, 2));
  }
  if (otherwise != kNoExpr) {
    const Text value = syntax.TextOf(syntax[otherwise]);
    text += hint != kNoExpr ? " = " : "=";
    text += value.size() > kMaxText ? std::string("...") : std::string(value);
  }
  return text;
}

std::string Workspace::Impl::TextOfFunction(FunctionId function, bool is_bound, bool has_name, bool is_short,
                                            int depth) {
  const FunctionInfo info = inference.function(function);
  const SourceFile* file = Get(info.file);
  std::string text = (info.flags & kIsAsync) != 0 ? "async def " : "def ";
  if (has_name)
    text += info.lambda != kNoExpr ? "lambda" : std::string(file->syntax.NameOf(file->syntax.stmt(info.stmt)));
  text += '(';
  const size_t count = inference.ParametersOf(info).size();
  bool is_first = true;
  for (size_t i = is_bound ? 1 : 0; i < count; ++i) {
    if (!is_first) text += ", ";
    is_first = false;
    text += TextOfParameter(info, i, is_short);
  }
  text += ')';
  const ExprId hint = info.lambda != kNoExpr ? kNoExpr : file->syntax.stmt(info.stmt).hint;
  std::string result;
  if (hint != kNoExpr && is_short && file->syntax[hint].kind != ExprKind::kSignatureHint) {
    result = file->syntax.TextOf(file->syntax[hint]);
  } else {
    const Value value = hint != kNoExpr ? inference.ValueOfHint(info.file, hint) : inference.ResultOfFunction(function);
    if (value.IsKnown()) result = WithoutBuiltins(TextOfSet(value.set, is_short, depth + 1));
  }
  if (!result.empty()) text += " -> " + result;
  return text;
}

std::string Workspace::Impl::DocumentationOf(FileId id, StmtId stmt) {
  const SourceFile* file = Get(id);
  if (file == nullptr) return {};
  const FileSyntax& syntax = file->syntax;
  const StmtId first = syntax.stmt(stmt).first_child;
  if (first == kModuleStmt || syntax.stmt(first).kind != StmtKind::kExpression) return {};
  const auto exprs = syntax.ExprsOf(syntax.stmt(first));
  if (exprs.size() != 1 || syntax[exprs[0]].kind != ExprKind::kString) return {};
  Text text = syntax.TextOf(syntax[exprs[0]]);
  while (!text.empty() && text.front() != '\'' && text.front() != '"') text.remove_prefix(1);
  const size_t quote = text.starts_with("\"\"\"") || text.starts_with("'''") ? 3 : 1;
  if (text.size() < 2 * quote) return {};
  text = text.substr(quote, text.size() - 2 * quote);
  // As inspect.cleandoc: the margin of the lines behind the first.
  std::vector<Text> lines;
  for (size_t begin = 0; begin <= text.size();) {
    size_t end = text.find('\n', begin);
    if (end == Text::npos) end = text.size();
    Text line = text.substr(begin, end - begin);
    if (line.ends_with('\r')) line.remove_suffix(1);
    lines.push_back(line);
    begin = end + 1;
  }
  const auto indent_of = [](Text line) { return line.find_first_not_of(" \t"); };
  size_t margin = SIZE_MAX;
  for (size_t i = 1; i < lines.size(); ++i)
    if (indent_of(lines[i]) != Text::npos) margin = std::min(margin, indent_of(lines[i]));
  std::string out;
  for (size_t i = 0; i < lines.size(); ++i) {
    const size_t cut = i == 0 ? indent_of(lines[i]) : margin;
    if (i > 0) out += '\n';
    if (cut != Text::npos && cut < lines[i].size()) out += lines[i].substr(cut);
  }
  while (!out.empty() && (out.back() == '\n' || out.back() == ' ')) out.pop_back();
  return out;
}

std::string Workspace::Impl::DocumentationOf(TypeId type) {
  const Type t = inference.types()[type];
  FileId file = kNoFile;
  StmtId stmt = kModuleStmt;
  if (t.kind == TypeKind::kModule) {
    file = modules[t.a].file != kNoFile ? modules[t.a].file : modules[t.a].stub;
    return file == kNoFile ? std::string() : DocumentationOf(file, kModuleStmt);
  }
  if (t.kind == TypeKind::kFunction) {
    const FunctionInfo& info = inference.function(t.a);
    if (info.lambda != kNoExpr) return {};
    file = info.file;
    stmt = info.stmt;
  } else if (t.kind == TypeKind::kClass) {
    const ClassInfo& info = inference.InfoOf(t.a);
    if (info.stmt == kModuleStmt) return {};
    file = info.file;
    stmt = info.stmt;
  } else {
    return {};
  }
  const SourceFile* source = Get(file);
  if (source == nullptr) return {};
  std::string found = DocumentationOf(file, stmt);
  if (found.empty() && source->is_stub) {
    const Binding binding = SourceOf({file, source->syntax.stmt(stmt).name_begin});
    const SourceFile* other = Get(binding.file);
    if (other != nullptr && binding.file != file) {
      const StmtId there = other->syntax.StatementNamedAt(binding.offset);
      if (there != kModuleStmt) found = DocumentationOf(binding.file, there);
    }
  }
  return found;
}

Value Workspace::Impl::ValueAt(const SourceFile& file, uint32_t index) {
  const Occurrence& occurrence = file.bindings.occurrences[index];
  const FileSyntax& syntax = file.syntax;
  if (occurrence.binds() || (occurrence.is_attribute && occurrence.role == NameRole::kWrite)) {
    if (occurrence.kind == NameKind::kParameter || occurrence.kind == NameKind::kVariable ||
        occurrence.kind == NameKind::kClass || occurrence.kind == NameKind::kFunction || occurrence.is_attribute) {
      const Value value = inference.ValueOfBinding({file.id, occurrence.begin});
      if (value.IsKnown()) return value;
    }
  }
  const ExprId named = syntax.NamedAt(occurrence.begin);
  if (named != kNoExpr) {
    const ExprKind kind = syntax[named].kind;
    if ((kind == ExprKind::kName || kind == ExprKind::kAttribute) && occurrence.role != NameRole::kImport) {
      const Value value = inference.ValueOf(file.id, named);
      if (value.IsKnown()) return value;
    }
  }
  Value value;
  const Entities entities = inference.EntitiesOf(file, index);
  for (const Entity& entity : entities.found) {
    const Value one = inference.ValueOfEntity(entity);
    value = inference.types().Union(value, one);
  }
  value.doubt |= entities.doubt;
  return value;
}

static bool EndsInItsOwnBracket(const Expr& expr) {
  switch (expr.kind) {
    case ExprKind::kCall:
    case ExprKind::kSubscript:
    case ExprKind::kList:
    case ExprKind::kSet:
    case ExprKind::kDict:
    case ExprKind::kListComprehension:
    case ExprKind::kSetComprehension:
    case ExprKind::kDictComprehension:
    case ExprKind::kPatternClass:
    case ExprKind::kPatternSequence:
    case ExprKind::kPatternMapping:
      return true;
    case ExprKind::kTuple:
    case ExprKind::kGenerator:
      return (expr.flags & kParenthesized) != 0;
    default:
      return false;
  }
}

// At a closing bracket the expression that it ends.
ExprId Workspace::Impl::ExpressionClosedAt(const SourceFile& file, uint32_t offset) {
  const Text text = file.text();
  if (offset >= text.size() || (text[offset] != ')' && text[offset] != ']' && text[offset] != '}')) return kNoExpr;
  ExprId expr = file.syntax.ExpressionAt(offset + 1);
  while (expr != kNoExpr && file.syntax[expr].end <= offset) expr = file.syntax[expr].parent;
  if (expr != kNoExpr && file.syntax[expr].end == offset + 1 && EndsInItsOwnBracket(file.syntax[expr])) return expr;
  // Round brackets are no part of what they hold, so these are counted: as many close an expression as open it.
  const auto is_space = [&](uint32_t place) { return IsBlank(text[place]) || IsLineEnd(text[place]); };
  uint32_t at = offset;
  uint32_t closed = 0;
  for (; at > 0 && (text[at] == ')' || is_space(at)); --at) closed += text[at] == ')' ? 1 : 0;
  ExprId held = kNoExpr;
  for (expr = file.syntax.ExpressionAt(at); expr != kNoExpr && file.syntax[expr].end <= offset;
       expr = file.syntax[expr].parent) {
    if ((file.syntax[expr].flags & kParenthesized) == 0) continue;
    held = expr;
    uint32_t opened = 0;
    for (uint32_t before = file.syntax[expr].begin; before > 0; --before) {
      if (text[before - 1] == '(')
        ++opened;
      else if (!is_space(before - 1))
        break;
    }
    if (closed <= opened) break;
    closed -= opened;
  }
  return held;
}

std::vector<std::string> Workspace::Types(FileId id, uint32_t offset) {
  Impl& in = *impl_;
  in.Begin();
  const SourceFile* file = in.Get(id);
  if (file == nullptr) return {};
  if (const ExprId closed = in.ExpressionClosedAt(*file, offset); closed != kNoExpr)
    return in.TextsOf(in.inference.ValueOf(id, closed));
  const uint32_t index = in.OccurrenceAt(*file, offset);
  if (index != kNoIndex) return in.TextsOf(in.ValueAt(*file, index));
  const ExprId expr = file->syntax.ExpressionAt(offset);
  return expr == kNoExpr ? std::vector<std::string>() : in.TextsOf(in.inference.ValueOf(id, expr));
}

void Workspace::Impl::Describe(Value value, Text name, Hover& hover) {
  hover.types = TextsOf(value);
  hover.certainty = CertaintyOf(value.doubt);
  for (const TypeId type : InOrder(value.set)) {
    const Type t = inference.types()[type];
    if (hover.documentation.empty()) hover.documentation = DocumentationOf(type);
    std::string line;
    if (t.kind == TypeKind::kFunction) {
      line = TextOfFunction(t.a, t.args_count > 0, true, true);
    } else if (t.kind == TypeKind::kClass) {
      const ClassInfo& info = inference.InfoOf(t.a);
      line = "class " + std::string(info.name);
      if (const auto constructor = inference.FindMember(t.a, "__init__");
          constructor && constructor->owner != inference.ClassNamed("builtins", "object")) {
        const Value init = inference.AttributeOf(inference.Just(inference.InstanceOf(t.a)), "__init__");
        for (const TypeId function : InOrder(init.set)) {
          if (inference.types()[function].kind != TypeKind::kFunction) continue;
          const std::string signature = TextOfFunction(inference.types()[function].a, true, false, true);
          const size_t open = signature.find('('), arrow = signature.rfind(" -> ");
          line += signature.substr(open, arrow == std::string::npos ? std::string::npos : arrow - open);
          break;
        }
      }
    } else if (t.kind == TypeKind::kModule) {
      line = TextOfType(type, true);
    }
    if (line.empty()) continue;
    if (!hover.text.empty()) hover.text += '\n';
    hover.text += line;
  }
  if (hover.text.empty() && value.IsKnown()) hover.text = std::string(name) + ": " + TextOfSet(value.set, true);
  if (hover.text.empty()) hover.text = name;
}

Hover Workspace::HoverAt(FileId id, uint32_t offset) {
  Impl& in = *impl_;
  in.Begin();
  Hover hover;
  const SourceFile* file = in.Get(id);
  if (file == nullptr) return hover;
  const uint32_t index = in.OccurrenceAt(*file, offset);
  if (index == kNoIndex) {
    const ExprId expr = file->syntax.ExpressionAt(offset);
    if (expr == kNoExpr) return hover;
    const Value value = in.inference.ValueOf(id, expr);
    if (!value.IsKnown()) return hover;
    hover.begin = file->syntax[expr].begin;
    hover.end = file->syntax[expr].end;
    hover.types = in.TextsOf(value);
    hover.text = in.TextOfSet(value.set, true);
    hover.certainty = CertaintyOf(value.doubt);
    return hover;
  }
  const Occurrence& occurrence = file->bindings.occurrences[index];
  hover.begin = occurrence.begin;
  hover.end = file->bindings.EndOf(occurrence);
  in.Describe(in.ValueAt(*file, index), file->bindings.TextOf(occurrence), hover);
  return hover;
}

std::vector<Signature> Workspace::Signatures(FileId id, uint32_t offset) {
  Impl& in = *impl_;
  in.Begin();
  std::vector<Signature> found;
  const SourceFile* file = in.Get(id);
  if (file == nullptr) return found;
  const FileSyntax& syntax = file->syntax;
  // The innermost call in whose brackets the place lies.
  ExprId call = syntax.ExpressionAt(offset);
  const auto is_inside = [&](ExprId expr) {
    if (syntax[expr].kind != ExprKind::kCall) return false;
    const ExprId function = syntax.ChildOf(expr, 0);
    const Text text = file->text();
    uint32_t open = syntax[function].end;
    while (open < text.size() && text[open] != '(') ++open;
    const bool is_closed =
        syntax[expr].end > open && syntax[expr].end <= text.size() && text[syntax[expr].end - 1] == ')';
    return offset > open && (!is_closed || offset < syntax[expr].end);
  };
  while (call != kNoExpr && !is_inside(call)) call = syntax[call].parent;
  if (call == kNoExpr) {
    // Behind what an unclosed bracket holds: the last call of the statement in front of the place.
    const StmtId stmt = syntax.StatementAt(offset > 0 ? offset - 1 : 0);
    for (ExprId expr = 1; expr < syntax.exprs.size(); ++expr) {
      if (syntax[expr].kind != ExprKind::kCall || syntax[expr].begin >= offset || syntax.StatementOf(expr) != stmt)
        continue;
      if (is_inside(expr) && (call == kNoExpr || syntax[expr].begin >= syntax[call].begin)) call = expr;
    }
  }
  if (call == kNoExpr) return found;
  const auto children = syntax.ChildrenOf(call);
  // Which argument: by the commas in front of the place at the call's own level.
  size_t position = 0;
  Text keyword;
  for (size_t i = 1; i < children.size(); ++i) {
    if (syntax[children[i]].end >= offset) {
      if (syntax[children[i]].kind == ExprKind::kKeyword && syntax[children[i]].begin < offset)
        keyword = syntax.NameOf(children[i]);
      break;
    }
    const size_t comma = file->text().find(',', syntax[children[i]].end);
    if (comma == Text::npos || comma >= offset) break;
    ++position;
  }
  const Value callee = in.inference.ValueOf(id, children[0]);
  const auto add = [&](FunctionId function, bool is_bound, Text name) {
    const FunctionInfo info = in.inference.function(function);
    const SourceFile* source = in.Get(info.file);
    Signature signature;
    signature.certainty = CertaintyOf(callee.doubt);
    const auto parameters = in.inference.ParametersOf(info);
    signature.label = std::string(name) + "(";
    size_t plain = 0;
    for (size_t i = is_bound ? 1 : 0; i < parameters.size(); ++i) {
      const auto kind = static_cast<ParameterKind>(source->syntax[parameters[i]].op);
      Parameter parameter;
      parameter.label = in.TextOfParameter(info, i, true);
      parameter.name = source->syntax.NameOf(parameters[i]);
      if (!signature.parameters.empty() || signature.label.back() != '(') signature.label += ", ";
      signature.label += parameter.label;
      if (kind == ParameterKind::kSlash || kind == ParameterKind::kBareStar) {
        if (kind == ParameterKind::kBareStar) plain = SIZE_MAX / 2;
        continue;
      }
      const auto number = static_cast<int>(signature.parameters.size());
      if (!keyword.empty()) {
        if (parameter.name == keyword || (kind == ParameterKind::kDoubleStar && signature.active < 0))
          signature.active = number;
      } else if (kind == ParameterKind::kStar) {
        if (signature.active < 0 && position >= plain) signature.active = number;
        plain = SIZE_MAX / 2;
      } else if (kind == ParameterKind::kPlain && plain++ == position) {
        signature.active = number;
      }
      signature.parameters.push_back(std::move(parameter));
    }
    signature.label += ")";
    if (info.lambda == kNoExpr) {
      const ExprId hint = source->syntax.stmt(info.stmt).hint;
      if (hint != kNoExpr && source->syntax[hint].kind != ExprKind::kSignatureHint)
        signature.label += " -> " + std::string(source->syntax.TextOf(source->syntax[hint]));
      signature.documentation = in.DocumentationOf(in.inference.types().Add(TypeKind::kFunction, function));
    }
    found.push_back(std::move(signature));
  };
  const auto add_functions = [&](Value value, bool is_bound, Text name) {
    for (const TypeId type : in.InOrder(value.set)) {
      const Type t = in.inference.types()[type];
      if (t.kind == TypeKind::kFunction) add(t.a, is_bound || t.args_count > 0, name);
    }
  };
  const Text written =
      syntax.NameOf(children[0]).empty() ? syntax.TextOf(syntax[children[0]]) : syntax.NameOf(children[0]);
  for (const TypeId type : in.InOrder(callee.set)) {
    const Type t = in.inference.types()[type];
    if (t.kind == TypeKind::kFunction) {
      add(t.a, t.args_count > 0, written);
    } else if (t.kind == TypeKind::kClass) {
      ClassInfo& info = in.inference.MembersOf(t.a);
      const ClassId object = in.inference.ClassNamed("builtins", "object");
      const auto init = in.inference.FindMember(t.a, "__init__");
      if ((!init || init->owner == object || info.is_named_tuple) && !info.fields.empty()) {
        Signature signature;
        signature.label = std::string(written) + "(";
        const SourceFile* source = in.Get(info.file);
        for (const MadeField& field : info.fields) {
          Parameter parameter;
          parameter.name = field.name;
          parameter.label = field.name;
          if (field.hint != kNoExpr)
            parameter.label += ": " + std::string(source->syntax.TextOf(source->syntax[field.hint]));
          if (!signature.parameters.empty()) signature.label += ", ";
          signature.label += parameter.label;
          if (keyword.empty() ? signature.parameters.size() == position : keyword == field.name)
            signature.active = static_cast<int>(signature.parameters.size());
          signature.parameters.push_back(std::move(parameter));
        }
        signature.label += ")";
        found.push_back(std::move(signature));
        continue;
      }
      const auto constructor = init && init->owner != object ? init : in.inference.FindMember(t.a, "__new__");
      if (constructor) {
        const Text name = init && init->owner != object ? "__init__" : "__new__";
        add_functions(in.inference.AttributeOf(in.inference.Just(in.inference.InstanceOf(t.a)), name), true, written);
      }
    } else if (t.kind == TypeKind::kInstance) {
      add_functions(in.inference.AttributeOf(in.inference.Just(type), "__call__"), true, written);
    }
  }
  return found;
}

}  // namespace quillet
