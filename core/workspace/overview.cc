// Outlines, symbols of the project, calls and problems.
#include <algorithm>
#include <map>
#include <optional>
#include <span>
#include <tuple>

#include "workspace/workspace_impl.h"

namespace quillet {

std::string Workspace::Impl::QualifiedName(const Binding& binding) {
  const SourceFile* file = Get(binding.file);
  const ModuleId module = modules.OfFile(binding.file);
  std::string name = module == kNoModule ? std::string() : modules[module].name;
  if (file == nullptr) return name;
  const uint32_t index = file->OccurrenceBeginningAt(binding.offset);
  if (index == kNoIndex) return name;
  const std::string around = DottedNameOf(file->bindings, file->bindings.ScopeOf(file->bindings.occurrences[index]));
  if (!around.empty()) name += "." + around;
  return name + "." + std::string(file->bindings.TextOf(file->bindings.occurrences[index]));
}

// Decorators and defaults are run by what is around the definition, the body of a lambda by the lambda.
Workspace::Impl::Body Workspace::Impl::BodyAround(const SourceFile& file, uint32_t offset) {
  const FileSyntax& syntax = file.syntax;
  Body body;
  if (!syntax.has_lambdas) return BodyOfStatementAt(file, offset);  // a long chain is not gone up for each of its names
  for (ExprId expr = syntax.ExpressionAt(offset); expr != kNoExpr; expr = syntax[expr].parent) {
    if (syntax[expr].kind != ExprKind::kLambda || syntax.ChildrenOf(expr).empty()) continue;
    if (offset < syntax[syntax.ChildrenOf(expr).back()].begin) continue;
    body.lambda = expr;
    return body;
  }
  return BodyOfStatementAt(file, offset);
}

Workspace::Impl::Body Workspace::Impl::BodyOfStatementAt(const SourceFile& file, uint32_t offset) {
  const FileSyntax& syntax = file.syntax;
  Body body;
  StmtId stmt = syntax.StatementAt(offset);
  if (stmt != kModuleStmt && syntax.stmt(stmt).kind == StmtKind::kDef && offset < syntax.stmt(stmt).end)
    stmt = syntax.stmt(stmt).parent;
  while (stmt != kModuleStmt && syntax.stmt(stmt).kind != StmtKind::kDef) stmt = syntax.stmt(stmt).parent;
  body.def = stmt;
  return body;
}

// What a place names: the definition or lambda that begins there, otherwise the body that it lies in.
Workspace::Impl::Body Workspace::Impl::BodyAt(const SourceFile& file, uint32_t offset) {
  const FileSyntax& syntax = file.syntax;
  const uint32_t index = OccurrenceAt(file, offset);
  if (index != kNoIndex) {
    const StmtId named = syntax.StatementNamedAt(file.bindings.occurrences[index].begin);
    if (named != kModuleStmt && syntax.stmt(named).kind == StmtKind::kDef) return {named, kNoExpr};
  }
  for (ExprId expr = syntax.ExpressionAt(offset); expr != kNoExpr; expr = syntax[expr].parent)
    if (syntax[expr].kind == ExprKind::kLambda && syntax[expr].begin == offset) return {kModuleStmt, expr};
  return BodyAround(file, offset);
}

std::vector<Workspace::Impl::Callee> Workspace::Impl::CalleesOf(Value callee) {
  std::vector<Callee> found;
  const Certainty certainty = CertaintyOf(callee.doubt);
  const auto add = [&](FileId id, uint32_t offset) {
    const Binding binding = SourceOf({id, offset});
    if (std::ranges::none_of(found, [&](const Callee& other) { return other.binding == binding; }))
      found.push_back({binding, QualifiedName(binding), certainty});
  };
  const auto add_function = [&](FunctionId id) {
    const FunctionInfo info = inference.function(id);
    const SourceFile* source = Get(info.file);
    if (source == nullptr) return;
    if (info.lambda != kNoExpr) {
      const Binding binding{info.file, source->syntax[info.lambda].begin};
      const std::string around = DottedNameOf(source->bindings, source->ScopeAt(binding.offset));
      const ModuleId module = modules.OfFile(info.file);
      std::string name = module == kNoModule ? std::string() : modules[module].name;
      if (!around.empty()) name += "." + around;
      found.push_back({binding, name + ".<lambda>", certainty});
      return;
    }
    add(info.file, source->syntax.stmt(info.stmt).name_begin);
  };
  for (const TypeId id : inference.types().CopyOf(callee.set)) {
    const Type t = inference.types()[id];
    if (t.kind == TypeKind::kForeign) {
      const Binding import = inference.ImportOfForeign(t.a);
      if (import.file != kNoFile) found.push_back({import, std::string(inference.NameOfNumber(t.a)), certainty});
    } else if (t.kind == TypeKind::kFunction) {
      add_function(t.a);
    } else if (t.kind == TypeKind::kClass) {
      const ClassId object = inference.ClassNamed("builtins", "object");
      const auto constructor = inference.FindMember(t.a, "__init__");
      bool has_own = false;
      if (constructor && constructor->owner != object && constructor->symbol != kNoIndex) {
        const Value init = inference.AttributeOf(inference.Just(inference.InstanceOf(t.a)), "__init__");
        for (const TypeId inner : inference.types().CopyOf(init.set)) {
          if (inference.types()[inner].kind != TypeKind::kFunction) continue;
          add_function(inference.types()[inner].a);
          has_own = true;
        }
      }
      const Value foreign = has_own ? Value() : inference.ForeignMember(t.a, "__init__");
      for (const TypeId inner : inference.types().CopyOf(foreign.set)) {
        const uint32_t name = inference.types()[inner].a;
        found.push_back(
            {inference.ImportOfForeign(name), std::string(inference.NameOfNumber(name)), Certainty::kLikely});
        has_own = true;
      }
      if (!has_own) {
        const ClassInfo& info = inference.InfoOf(t.a);
        const SourceFile* source = Get(info.file);
        if (source != nullptr && info.stmt != kModuleStmt) add(info.file, source->syntax.stmt(info.stmt).name_begin);
      }
    } else if (t.kind == TypeKind::kInstance) {
      const Value method = inference.AttributeOf(inference.Just(id), "__call__");
      for (const TypeId inner : inference.types().CopyOf(method.set))
        if (inference.types()[inner].kind == TypeKind::kFunction) add_function(inference.types()[inner].a);
    }
  }
  return found;
}

std::vector<Workspace::Impl::Callee> Workspace::Impl::CalleesOf(const SourceFile& file, ExprId call) {
  const ExprId function = file.syntax.ChildOf(call, 0);
  std::vector<Callee> found = CalleesOf(inference.ValueOf(file.id, function));
  if (!found.empty()) return found;
  const ExprKind kind = file.syntax[function].kind;
  if (kind != ExprKind::kAttribute && kind != ExprKind::kName) return found;
  const uint32_t at = file.OccurrenceBeginningAt(kind == ExprKind::kName ? file.syntax[function].begin
                                                                         : file.syntax[function].name_begin);
  if (at == kNoIndex) return found;
  for (const Location& location : MembersBelow(file, function)) {
    const Binding binding{location.file, location.begin};
    if (location.kind == "function") {
      found.push_back({binding, QualifiedName(binding), Certainty::kLikely});
      continue;
    }
    Value value = inference.ValueOfBinding(binding);
    value.doubt |= Value::kGuessed;
    for (Callee& callee : CalleesOf(value)) found.push_back(std::move(callee));
  }
  if (!found.empty()) return found;
  const Entities entities = inference.EntitiesOf(file, at);
  for (const Entity& entity : entities.found) {
    if (entity.kind == Entity::kModule) continue;
    const SourceFile* owner = entity.kind == Entity::kVariable ? Get(entity.a) : nullptr;
    const std::vector<Binding> bindings =
        owner != nullptr ? inference.DefinitionsOf(*owner, entity.b) : inference.BindingsOf(entity);
    for (const Binding& binding : bindings) {
      const SourceFile* source = Get(binding.file);
      if (source == nullptr || source->syntax.StatementNamedAt(binding.offset) == kModuleStmt) continue;
      const Binding there = SourceOf(binding);
      found.push_back({there, QualifiedName(there), CertaintyOf(entities.doubt)});
    }
  }
  return found;
}

// An attribute that a class does not have of itself: where its subclasses in the project define it.
std::vector<Location> Workspace::Impl::MembersBelow(const SourceFile& file, ExprId attribute) {
  std::vector<Location> found;
  const FileSyntax& syntax = file.syntax;
  if (syntax[attribute].kind != ExprKind::kAttribute) return found;
  const Text name = syntax.NameOf(attribute);
  const Value receiver = inference.ValueOf(file.id, syntax.ChildOf(attribute, 0));
  for (const TypeId type : inference.types().CopyOf(receiver.set)) {
    const Type t = inference.types()[type];
    if ((t.kind != TypeKind::kInstance && t.kind != TypeKind::kClass) || inference.FindMember(t.a, name)) continue;
    if (!IsProject(inference.InfoOf(t.a).file)) continue;
    static constexpr size_t kMaxFiles = 200;
    size_t count = 0;
    const std::string of_class(inference.InfoOf(t.a).name);
    for (const FileId id : project.DefiningMember(name, of_class)) {
      if (count == kMaxFiles) break;
      if (!defined.MayDefineMember(id, name)) continue;
      const SourceFile* source = Get(id);
      if (source == nullptr || NumberOfText(source->bindings, name) == kNoIndex ||
          NumberOfText(source->bindings, of_class) == kNoIndex)
        continue;
      ++count;
      for (StmtId stmt = 1; stmt < source->syntax.stmts.size(); ++stmt) {
        if (source->syntax.stmt(stmt).kind != StmtKind::kClass) continue;
        const ClassId cls = inference.ClassOfStmt(id, stmt);
        if (cls == t.a || !inference.IsSubclass(cls, t.a)) continue;
        const auto member = inference.FindMember(cls, name);
        if (!member || member->owner != cls) continue;
        for (const Binding& binding : inference.BindingsOf(inference.EntityOfMember(*member, name)))
          found.push_back(At(binding, Certainty::kLikely));
      }
    }
  }
  Sort(found);
  return found;
}

namespace {

// Finds the lambda in whose body a place lies, for who asks about many places of a file.
class LambdaBodies {
 public:
  explicit LambdaBodies(const FileSyntax& syntax) {
    for (ExprId expr = 1; expr < syntax.exprs.size(); ++expr) {
      if (syntax[expr].kind != ExprKind::kLambda || syntax[expr].children_count == 0) continue;
      bodies_.push_back({syntax[syntax.ChildrenOf(expr).back()].begin, syntax[expr].end, expr, kNoIndex});
    }
    // Each lies in one of those in front of it, or in none.
    std::ranges::sort(bodies_, {}, [](const Body& body) { return std::pair(body.begin, ~body.end); });
    for (uint32_t i = 1; i < bodies_.size(); ++i) bodies_[i].around = InnermostFrom(i - 1, bodies_[i].begin);
  }

  // kNoExpr where it lies in none.
  ExprId At(uint32_t offset) const {
    const auto behind = std::ranges::upper_bound(bodies_, offset, {}, &Body::begin);
    if (behind == bodies_.begin()) return kNoExpr;
    const uint32_t found = InnermostFrom(static_cast<uint32_t>(behind - bodies_.begin() - 1), offset);
    return found == kNoIndex ? kNoExpr : bodies_[found].lambda;
  }

 private:
  struct Body {
    uint32_t begin, end;
    ExprId lambda;
    uint32_t around;
  };

  uint32_t InnermostFrom(uint32_t at, uint32_t offset) const {
    while (at != kNoIndex && bodies_[at].end <= offset) at = bodies_[at].around;
    return at;
  }

  std::vector<Body> bodies_;
};

}  // namespace

std::vector<Call> Workspace::Callees(FileId id, uint32_t offset) {
  Impl& in = *impl_;
  in.Begin();
  std::vector<Call> found;
  const SourceFile* file = in.Get(id);
  if (file == nullptr) return found;
  const FileSyntax& syntax = file->syntax;
  const Impl::Body body = in.BodyAt(*file, offset);
  uint32_t begin = 0, end = static_cast<uint32_t>(file->text().size());
  if (body.lambda != kNoExpr) {
    begin = syntax[body.lambda].begin;
    end = syntax[body.lambda].end;
  } else if (body.def != kModuleStmt) {
    begin = syntax.stmt(body.def).end;
    end = syntax.stmt(body.def).block_end;
  }
  const LambdaBodies lambdas(syntax);
  const auto is_here = [&](uint32_t at) {
    if (at < begin || at >= end) return false;
    const ExprId lambda = lambdas.At(at);
    return (lambda != kNoExpr ? Impl::Body{kModuleStmt, lambda} : in.BodyOfStatementAt(*file, at)) == body;
  };
  std::map<std::tuple<FileId, uint32_t, std::string>, size_t> places;  // in `found`
  const auto add = [&](ExprId at, const std::vector<Impl::Callee>& callees, bool only_project = false) {
    Location call;
    call.file = id;
    call.begin = syntax[at].kind == ExprKind::kAttribute ? syntax[at].name_begin : syntax[at].begin;
    call.end = syntax[at].end;
    call.role = "call";
    for (const Impl::Callee& callee : callees) {
      if (only_project && !in.IsProject(callee.binding.file)) continue;
      call.certainty = callee.certainty;
      const auto [place, is_new] =
          places.try_emplace({callee.binding.file, callee.binding.offset, callee.name}, found.size());
      if (is_new) {
        Call made;
        made.function = in.At(callee.binding, callee.certainty);
        made.name = callee.name;
        found.push_back(std::move(made));
      }
      Call* const known = &found[place->second];
      known->function.certainty = std::min(known->function.certainty, callee.certainty);
      known->calls.push_back(call);
    }
  };
  const auto method_of = [&](Value receiver, Text name) {
    return in.CalleesOf(in.inference.AttributeOf(receiver, name));
  };
  const auto iterate = [&](ExprId iterable, bool is_async) {
    const Value value = in.inference.ValueOf(id, iterable);
    const Value method = in.inference.AttributeOf(value, is_async ? "__aiter__" : "__iter__");
    add(iterable, in.CalleesOf(method), true);
    std::vector<Argument> none;
    add(iterable, method_of(in.inference.ResultOf(method, none), is_async ? "__anext__" : "__next__"), true);
  };
  const auto only = [&](Value value, TypeKind kind) {
    std::vector<TypeId> kept;
    for (const TypeId type : in.inference.types().CopyOf(value.set))
      if (in.inference.types()[type].kind == kind) kept.push_back(type);
    return Value{in.inference.types().SetOf(kept), value.doubt};
  };
  for (ExprId expr = 1; expr < syntax.exprs.size(); ++expr) {
    const Expr& e = syntax[expr];
    if (e.begin >= end || e.end <= begin) continue;
    if (e.kind == ExprKind::kCall) {
      const ExprId called = syntax.ChildOf(expr, 0);
      if (!is_here(syntax[called].kind == ExprKind::kAttribute ? syntax[called].name_begin : syntax[called].begin))
        continue;
      in.inference.BeginPart();
      const std::vector<Impl::Callee> callees = in.CalleesOf(*file, expr);
      add(called, callees);
      // What the library is given to call, it likely calls.
      const auto is_project = [&](const Impl::Callee& callee) { return in.IsProject(callee.binding.file); };
      if (callees.empty() || std::ranges::any_of(callees, is_project)) continue;
      for (const ExprId argument : syntax.ChildrenOf(expr).subspan(1)) {
        const ExprId given = syntax[argument].kind == ExprKind::kKeyword ? syntax.ChildOf(argument, 0) : argument;
        if (given == kNoExpr) continue;
        Value value = only(in.inference.ValueOf(id, given), TypeKind::kFunction);
        value.doubt |= Value::kGuessed;
        add(given, in.CalleesOf(value), true);
      }
    } else if (e.kind == ExprKind::kComprehensionFor && e.children_count > 1 && is_here(e.begin)) {
      iterate(syntax.ChildOf(expr, 1), (e.flags & kAsyncClause) != 0);
    } else if (e.kind == ExprKind::kWithItem && is_here(e.begin)) {
      const ExprId manager = syntax.ChildOf(expr, 0);
      const Value value = in.inference.ValueOf(id, manager);
      const bool is_async = (syntax.stmt(syntax.StatementOf(expr)).flags & kAsyncStmt) != 0;
      add(manager, method_of(value, is_async ? "__aenter__" : "__enter__"), true);
      add(manager, method_of(value, is_async ? "__aexit__" : "__exit__"), true);
    }
  }
  for (StmtId stmt = 1; stmt < syntax.stmts.size(); ++stmt) {
    const Stmt& at = syntax.stmt(stmt);
    const auto exprs = syntax.ExprsOf(at);
    if (at.kind == StmtKind::kFor && exprs.size() > 1 && is_here(at.begin)) {
      iterate(exprs[1], (at.flags & kAsyncStmt) != 0);
    } else if (at.kind == StmtKind::kRaise && !exprs.empty() && is_here(at.begin)) {
      add(exprs[0], in.CalleesOf(only(in.inference.ValueOf(id, exprs[0]), TypeKind::kClass)), true);
    } else if (at.decorator_count > 0) {
      for (const ExprId decorator : syntax.DecoratorsOf(at))
        if (is_here(syntax[decorator].begin)) add(decorator, in.CalleesOf(in.inference.ValueOf(id, decorator)), true);
    }
  }
  return found;
}

std::vector<Call> Workspace::Callers(FileId id, uint32_t offset) {
  Impl& in = *impl_;
  in.BeginAnew();
  std::vector<Call> found;
  const SourceFile* file = in.Get(id);
  const uint32_t index = file == nullptr ? kNoIndex : in.OccurrenceAt(*file, offset);
  if (index == kNoIndex) return found;
  std::optional<Impl::Visit> visit;  // of the file of the hits that follow each other
  FileId visited = kNoFile;
  for (const Impl::Hit& hit : in.Uses(*file, index, true)) {
    if (visited != hit.file) visit.emplace(in, hit.file);
    visited = hit.file;
    const SourceFile* source = visit->file;
    const bool decorates = hit.occurrence != kNoIndex && hit.location.role == "read" &&
                           (source->bindings.occurrences[hit.occurrence].flags & kNameDecorator) != 0;
    if (hit.location.role != "call" && !decorates) continue;
    const Impl::Body body = in.BodyAround(*source, hit.location.begin);
    StmtId around = body.def;
    if (body.lambda != kNoExpr) {  // the definition that the lambda stands in
      around = source->syntax.StatementAt(hit.location.begin);
      while (around != kModuleStmt && source->syntax.stmt(around).kind != StmtKind::kDef)
        around = source->syntax.stmt(around).parent;
    }
    const Binding binding{hit.file, around == kModuleStmt ? 0 : source->syntax.stmt(around).name_begin};
    auto at = std::ranges::find_if(found, [&](const Call& other) {
      return other.function.file == hit.file && other.function.begin == binding.offset;
    });
    if (at == found.end()) {
      Call made;
      if (around == kModuleStmt) {
        made.function.file = hit.file;
        made.function.role = made.function.kind = "module";
        const ModuleId module = in.modules.OfFile(hit.file);
        if (module != kNoModule) made.name = in.modules[module].name;
      } else {
        made.function = in.At(binding, hit.location.certainty);
        made.name = in.QualifiedName(binding);
      }
      made.function.certainty = hit.location.certainty;
      found.push_back(std::move(made));
      at = found.end() - 1;
    }
    at->function.certainty = std::min(at->function.certainty, hit.location.certainty);
    at->calls.push_back(hit.location);
  }
  return found;
}

// What stands behind the name of a function or class, as one would write it on one line: without comments, line ends
// and the comma behind the last parameter, and not longer than a reader wants it.
static std::string OnOneLine(Text head) {
  static constexpr size_t kMaxHead = 200;
  std::string line;
  char quote = 0;
  for (size_t i = 0; i < head.size(); ++i) {
    const char c = head[i];
    if (quote != 0) {
      line += c;
      if (c == '\\' && i + 1 < head.size())
        line += head[++i];
      else if (c == quote)
        quote = 0;
      continue;
    }
    if (c == '#') {
      while (i + 1 < head.size() && head[i + 1] != '\n' && head[i + 1] != '\r') ++i;
    } else if (c == ' ' || c == '\t' || c == '\n' || c == '\r' || c == '\f' || c == '\\') {
      if (!line.empty() && Text(" ([{").find(line.back()) == Text::npos) line += ' ';
    } else {
      if (c == ')' || c == ']' || c == '}') {
        if (c == ')' && line.ends_with(", ")) line.resize(line.size() - 2);
        while (!line.empty() && line.back() == ' ') line.pop_back();
      }
      if (c == '"' || c == '\'') quote = c;
      line += c;
    }
  }
  while (!line.empty() && line.back() == ' ') line.pop_back();
  if (line.size() > kMaxHead) {
    size_t end = kMaxHead;
    while (end > 0 && (static_cast<unsigned char>(line[end]) & 0xC0) == 0x80) --end;
    line.resize(end);
  }
  return line;
}

std::vector<OutlineItem> Workspace::Outline(FileId id) {
  Impl& in = *impl_;
  in.Begin();
  std::vector<OutlineItem> items;
  const SourceFile* file = in.Get(id);
  if (file == nullptr) return items;
  const FileSyntax& syntax = file->syntax;
  std::unordered_map<StmtId, int> item_of;
  std::set<std::pair<int, std::string>> variables;
  for (StmtId stmt = 1; stmt < syntax.stmts.size(); ++stmt) {
    const Stmt& at = syntax.stmt(stmt);
    StmtId around = at.parent;
    while (around != kModuleStmt && !item_of.contains(around)) around = syntax.stmt(around).parent;
    const int parent = around == kModuleStmt ? -1 : item_of[around];
    if (at.kind == StmtKind::kDef || at.kind == StmtKind::kClass) {
      if (at.name_begin == at.name_end) continue;
      OutlineItem item;
      item.name = syntax.NameOf(at);
      const bool in_class = parent >= 0 && items[static_cast<size_t>(parent)].kind == "class";
      item.kind = at.kind == StmtKind::kClass ? "class" : in_class ? "method" : "function";
      const auto decorators = syntax.DecoratorsOf(at);
      item.begin = decorators.empty()
                       ? at.begin
                       : std::min(at.begin, syntax[decorators[0]].begin - (syntax[decorators[0]].begin > 0 ? 1 : 0));
      item.end = at.block_end;
      item.name_begin = at.name_begin;
      item.name_end = at.name_end;
      item.parent = parent;
      if (at.end > at.name_end) {
        Text head = Text(syntax.source + at.name_end, at.end - at.name_end);
        while (!head.empty() && (head.back() == ':' || head.back() == ' ')) head.remove_suffix(1);
        item.detail = OnOneLine(head);
      }
      item_of[stmt] = static_cast<int>(items.size());
      items.push_back(std::move(item));
      continue;
    }
    if (at.kind != StmtKind::kAssign && at.kind != StmtKind::kAnnotated && at.kind != StmtKind::kTypeAlias) continue;
    if (parent >= 0 && items[static_cast<size_t>(parent)].kind != "class") continue;
    const auto exprs = syntax.ExprsOf(at);
    for (size_t i = 0; i < exprs.size(); ++i) {
      const ExprId target = exprs[i];
      const bool is_target = at.kind == StmtKind::kTypeAlias ? i == 0 : (syntax[target].flags & kIsTarget) != 0;
      if (!is_target || syntax[target].kind != ExprKind::kName) continue;
      std::string name(syntax.TextOf(syntax[target]));
      if (!variables.emplace(parent, name).second) continue;
      OutlineItem item;
      item.name = std::move(name);
      item.kind = parent >= 0 ? "attribute" : "variable";
      item.begin = at.begin;
      item.end = at.end;
      item.name_begin = syntax[target].begin;
      item.name_end = syntax[target].end;
      item.parent = parent;
      items.push_back(std::move(item));
    }
  }
  return items;
}

static bool IsSymbol(NameKind kind) {
  return kind == NameKind::kClass || kind == NameKind::kFunction || kind == NameKind::kVariable;
}

std::vector<SymbolInfo> Workspace::Symbols(Text query, size_t most) {
  Impl& in = *impl_;
  in.Begin();
  struct Ranked {
    int rank;
    size_t size;                                 // of the name
    uint32_t file;                               // its place among all
    const DefinedNames::Definition* definition;  // nullptr where that is not known yet
  };
  std::vector<Ranked> found;
  const auto lower = [](char c) { return c >= 'A' && c <= 'Z' ? static_cast<char>(c + ('a' - 'A')) : c; };
  // 0 exact, 1 but for case, 2 prefix, 3 part, 4 its letters in order; -1 not at all.
  const auto match = [&](Text name) {
    if (name == query) return 0;
    const auto same = [&](char a, char b) { return lower(a) == lower(b); };
    if (std::ranges::equal(name, query, same)) return 1;
    if (name.size() >= query.size() && std::ranges::equal(name.substr(0, query.size()), query, same)) return 2;
    if (std::search(name.begin(), name.end(), query.begin(), query.end(), same) != name.end()) return 3;
    size_t at = 0;
    for (const char c : name)
      if (at < query.size() && lower(c) == lower(query[at])) ++at;
    return at == query.size() ? 4 : -1;
  };
  const std::vector<FileId>& files = in.project.All();
  in.defined.ReadPossible(files);
  // A name is compared once, wherever it is defined.
  static constexpr int kNotAsked = -2;
  std::vector<int8_t> ranks;
  const auto rank_of = [&](uint32_t name) {
    if (name >= ranks.size()) ranks.resize(in.defined.text_count(), kNotAsked);
    int8_t& rank = ranks[name];
    if (rank == kNotAsked) rank = static_cast<int8_t>(match(in.defined.TextOf(name)));
    return rank;
  };
  const auto add = [&](uint32_t file, uint32_t name, bool is_variable, const DefinedNames::Definition* definition) {
    const int rank = rank_of(name);
    if (rank < 0) return;
    found.push_back({rank * 2 + (is_variable ? 1 : 0), in.defined.TextOf(name).size(), file, definition});
  };
  const auto add_defined = [&](uint32_t file) {
    for (const DefinedNames::Definition& definition : in.defined.Of(files[file])) {
      if (definition.is_symbol && IsSymbol(definition.kind))
        add(file, definition.name, definition.kind == NameKind::kVariable, &definition);
    }
  };
  for (uint32_t i = 0; i < files.size(); ++i) {
    if (in.defined.IsRead(files[i])) {
      add_defined(i);
    } else {
      for (const auto& symbol : in.defined.PossibleOf(files[i])) add(i, symbol.name, symbol.is_variable != 0, nullptr);
    }
  }
  // Those that are alike in the order of files, and what may be there in front of what is.
  const auto order = [](const Ranked& a, const Ranked& b) {
    const auto begin_of = [](const Ranked& at) {
      return at.definition == nullptr ? 0 : int64_t{at.definition->begin} + 1;
    };
    return std::tuple(a.rank, a.size, a.file, begin_of(a)) < std::tuple(b.rank, b.size, b.file, begin_of(b));
  };
  // Files are read as long as what they may define would be among the first ones.
  size_t count = 0;
  while (true) {
    count = std::min(most, found.size());
    std::ranges::partial_sort(found, found.begin() + static_cast<ptrdiff_t>(count), order);
    std::vector<uint32_t> unread;
    for (const Ranked& ranked : std::span(found).first(count))
      if (ranked.definition == nullptr) unread.push_back(ranked.file);
    if (unread.empty()) break;
    std::ranges::sort(unread);
    unread.erase(std::unique(unread.begin(), unread.end()), unread.end());
    std::vector<FileId> read;
    for (const uint32_t file : unread) read.push_back(files[file]);
    in.defined.Read(read);
    std::erase_if(found, [&](const Ranked& ranked) { return std::ranges::binary_search(unread, ranked.file); });
    for (const uint32_t file : unread) add_defined(file);
  }
  std::vector<SymbolInfo> symbols;
  for (const Ranked& ranked : std::span(found).first(count)) {
    const DefinedNames::Definition& definition = *ranked.definition;
    SymbolInfo symbol;
    symbol.name = in.defined.TextOf(definition.name);
    symbol.kind = definition.kind == NameKind::kClass      ? "class"
                  : definition.kind == NameKind::kFunction ? (definition.in_class ? "method" : "function")
                                                           : "variable";
    symbol.file = files[ranked.file];
    const ModuleId module = in.modules.OfFile(symbol.file);
    symbol.container = module == kNoModule ? std::string() : in.modules[module].name;
    if (definition.scope != kNoIndex) {
      symbol.container += '.';
      symbol.container += in.defined.TextOf(definition.scope);
    }
    symbol.begin = definition.begin;
    symbol.end = definition.begin + static_cast<uint32_t>(symbol.name.size());
    symbol.place = {definition.line, definition.column};
    symbol.end_column = definition.column + static_cast<int32_t>(symbol.name.size());
    symbols.push_back(std::move(symbol));
  }
  // Those whose columns must be counted, of a file one after the other, so that it is read once.
  std::vector<SymbolInfo*> uncounted;
  for (SymbolInfo& symbol : symbols)
    if (symbol.place.col == 0) uncounted.push_back(&symbol);
  std::ranges::sort(uncounted, {}, [](const SymbolInfo* symbol) { return std::pair(symbol->file, symbol->begin); });
  for (SymbolInfo* symbol : uncounted) {
    symbol->place = PlaceOf(symbol->file, symbol->begin);
    symbol->end_column = PlaceOf(symbol->file, symbol->end).col;
  }
  return symbols;
}

std::vector<Location> Workspace::Named(Text dotted) {
  Impl& in = *impl_;
  in.Begin();
  std::vector<Location> found;
  const size_t dot = dotted.rfind('.');
  const Text last = dot == Text::npos ? dotted : dotted.substr(dot + 1);
  const Text rest = dot == Text::npos ? Text() : dotted.substr(0, dot);
  for (const FileId id : in.project.WithWords({last})) {
    const Impl::Visit visit(in, id);
    const SourceFile* file = visit.file;
    if (file == nullptr) continue;
    for (uint32_t i = 0; i < file->bindings.occurrences.size(); ++i) {
      const Occurrence& occurrence = file->bindings.occurrences[i];
      if (file->bindings.TextOf(occurrence) != last) continue;
      const bool is_self = occurrence.is_attribute && occurrence.role == NameRole::kWrite;
      if (!is_self &&
          (!occurrence.binds() || occurrence.kind == NameKind::kImport || occurrence.kind == NameKind::kParameter))
        continue;
      uint32_t scope = file->bindings.ScopeOf(occurrence);
      if (is_self) scope = file->bindings.scopes[scope].parent;
      if (scope == kNoIndex) continue;
      const ModuleId module = in.modules.OfFile(id);
      std::string full = module == kNoModule ? std::string() : in.modules[module].name;
      const std::string around = DottedNameOf(file->bindings, scope);
      if (!around.empty()) full += "." + around;
      const bool fits =
          rest.empty() ? around.empty() || !is_self : full == rest || full.ends_with("." + std::string(rest));
      if (fits) found.push_back(in.At({id, occurrence.begin}, Certainty::kCertain));
    }
  }
  in.Sort(found);
  return found;
}

}  // namespace quillet
