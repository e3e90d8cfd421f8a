// Which bindings a name has where it is used: those that reach it, those of its variable, those behind all that runs.
#include <algorithm>

#include "inference/flow.h"
#include "inference/inference.h"

namespace quillet {

namespace {

// Scopes whose code runs where it stands.
bool RunsInPlace(NameScopeKind kind) {
  return kind == NameScopeKind::kComprehension || kind == NameScopeKind::kClass ||
         kind == NameScopeKind::kTypeParameters || kind == NameScopeKind::kAnnotation;
}

}  // namespace

bool Inference::IsReachable(const SourceFile& file, StmtId id) {
  enum ClauseReach : uint8_t { kIsReachable = 1, kEndsChain = 2 };  // nothing of its chain behind it runs
  const FileSyntax& syntax = file.syntax;
  const auto key = [&](StmtId stmt) { return (uint64_t{file.id} << 32 | stmt) + 1; };
  const auto is_clause = [](StmtKind kind) {
    return kind == StmtKind::kIf || kind == StmtKind::kElif || kind == StmtKind::kElse;
  };
  std::vector<StmtId> chain;
  for (; id != kModuleStmt; id = syntax.stmt(id).parent) {
    if (!is_clause(syntax.stmt(id).kind)) continue;
    const uint8_t* known = reachable_clauses_.Find(key(id));
    if (known == nullptr) {
      // Those in front of it of which nothing is known yet, and then each from the one in front.
      chain.assign(1, id);
      uint8_t before = 0;
      for (StmtId at = id; syntax.stmt(at).kind != StmtKind::kIf;) {
        at = syntax.stmt(at).previous;
        if (at == kModuleStmt || (syntax.stmt(at).kind != StmtKind::kIf && syntax.stmt(at).kind != StmtKind::kElif))
          break;
        known = reachable_clauses_.Find(key(at));
        if (known != nullptr) {
          before = *known;
          break;
        }
        chain.push_back(at);
      }
      CountSteps(static_cast<int64_t>(chain.size()));
      for (size_t i = chain.size(); i-- > 0;) {
        const auto exprs = syntax.ExprsOf(syntax.stmt(chain[i]));
        const bool has_condition = syntax.stmt(chain[i]).kind != StmtKind::kElse && !exprs.empty();
        const int truth = has_condition ? StaticTruth(file, exprs[0]) : -1;
        const bool is_behind_end = (before & kEndsChain) != 0;
        before = static_cast<uint8_t>((truth != 0 && !is_behind_end ? kIsReachable : 0) |
                                      (truth == 1 || is_behind_end ? kEndsChain : 0));
        reachable_clauses_.Put(key(chain[i]), before);
      }
      if ((before & kIsReachable) == 0) return false;
      continue;
    }
    if ((*known & kIsReachable) == 0) return false;
  }
  return true;
}

const std::vector<Binding>& Inference::BindingsReaching(const SourceFile& file, uint32_t index, bool* may_be_unbound) {
  const Reaching& found = reaching_.Get(file.id, index, [&] { return FindBindingsReaching(file, index); });
  if (may_be_unbound != nullptr) *may_be_unbound = found.may_be_unbound;
  return found.bindings;
}

const Inference::OwnBindings& Inference::BindingsOfVariable(const SourceFile& file, uint32_t variable) {
  return own_bindings_.Get(file.id, variable, [&] { return FindBindingsOfVariable(file, variable); });
}

Inference::OwnBindings Inference::FindBindingsOfVariable(const SourceFile& file, uint32_t variable) {
  const NameSymbol& owner = file.bindings.symbols[variable];
  OwnBindings found;
  const auto indices = file.occurrences().Of(variable);
  CountSteps(static_cast<int64_t>(indices.size()));
  for (const uint32_t i : indices) {
    const Occurrence& other = file.bindings.occurrences[i];
    if (!other.binds()) continue;
    if (!IsReachable(file, file.syntax.StatementAt(other.begin))) {
      found.unreachable.push_back(other.begin);
      continue;
    }
    uint32_t at = file.bindings.ScopeOf(other);
    while (at != owner.scope && at != kNoIndex && file.bindings.scopes[at].kind == NameScopeKind::kComprehension)
      at = file.bindings.scopes[at].parent;
    if (other.kind == NameKind::kParameter) {
      found.parameters.push_back(other.begin);
    } else {
      (at == owner.scope ? found.own : found.elsewhere).push_back(other.begin);
    }
  }
  DropImportsOfItself(file, found.own);
  return found;
}

Inference::Reaching Inference::FindBindingsReaching(const SourceFile& file, uint32_t index) {
  const Occurrence& occurrence = file.bindings.occurrences[index];
  const uint32_t variable = file.bindings.VariableOf(occurrence);
  if (variable == kNoIndex) return {};
  const NameSymbol& owner = file.bindings.symbols[variable];
  const NameScope& scope = file.bindings.scopes[owner.scope];
  const OwnBindings& all = BindingsOfVariable(file, variable);
  const std::vector<uint32_t>&own = all.own, &elsewhere = all.elsewhere, &parameters = all.parameters;
  std::vector<uint32_t> reached;
  bool is_bound = false;
  if (scope.kind != NameScopeKind::kModule && scope.kind != NameScopeKind::kFunction &&
      scope.kind != NameScopeKind::kClass) {
    reached = own;
    reached.insert(reached.end(), parameters.begin(), parameters.end());
    is_bound = true;
  } else if (!own.empty()) {
    const StmtId top = file.StmtOfScope(owner.scope);
    bool is_deferred = file.is_stub;
    for (uint32_t at = file.bindings.ScopeOf(occurrence); at != owner.scope && at != kNoIndex;
         at = file.bindings.scopes[at].parent)
      if (!RunsInPlace(file.bindings.scopes[at].kind)) is_deferred = true;
    const std::function<int(ExprId)> truth = [&](ExprId condition) { return StaticTruth(file, condition); };
    Flow flow(file, own, truth);
    is_bound = is_deferred ? flow.ReachEnd(top, reached) : flow.Reach(occurrence.begin, top, reached);
    if (is_deferred && !is_bound) is_bound = !reached.empty();
    if (is_deferred || (reached.empty() && parameters.empty()))
      reached.insert(reached.end(), elsewhere.begin(), elsewhere.end());
    // A name that is used in front of its binding: by a hint, by a decorator in a loop, by mistake.
    if (reached.empty() && parameters.empty()) flow.ReachEnd(top, reached);
    CountLooks(flow.looks());
  } else {
    reached = elsewhere;
  }
  if (!is_bound) reached.insert(reached.end(), parameters.begin(), parameters.end());
  if (reached.empty()) reached = own.empty() ? all.unreachable : own;
  if (reached.size() > Flow::kMaxBindings) reached.resize(Flow::kMaxBindings);
  std::ranges::sort(reached);
  Reaching found;
  found.may_be_unbound = !is_bound && parameters.empty();
  found.bindings.reserve(reached.size());
  for (const uint32_t offset : reached) found.bindings.push_back({file.id, offset});
  return found;
}

Entity Inference::EntityOfVariable(const SourceFile& file, uint32_t symbol) {
  const uint32_t variable = file.bindings.symbols[symbol].variable;
  const NameSymbol& owner = file.bindings.symbols[variable];
  const ClassId cls = ClassOfScope(file, owner.scope);
  if (cls != kNoId) {
    // As it is spelled: a private name is mangled in its scope.
    Text name = file.bindings.texts[owner.name];
    const auto occurrences = file.occurrences().Of(variable);
    if (!occurrences.empty()) name = file.bindings.TextOf(file.bindings.occurrences[occurrences.front()]);
    return {Entity::kMember, cls, NumberOfName(name)};
  }
  return {Entity::kVariable, file.id, variable};
}

std::vector<Binding> Inference::BindingsOf(const Entity& entity) {
  std::vector<Binding> found;
  switch (entity.kind) {
    case Entity::kVariable: {
      const SourceFile* file = FileOf(entity.a);
      if (file == nullptr) break;
      for (const uint32_t i : file->occurrences().Of(entity.b))
        if (file->bindings.occurrences[i].binds()) found.push_back({entity.a, file->bindings.occurrences[i].begin});
      break;
    }
    case Entity::kMember: {
      ClassInfo& info = MembersOf(entity.a);
      const Text name = NameOfNumber(entity.b);
      const SourceFile* file = FileOf(info.file);
      if (file == nullptr) break;
      if (const auto at = info.symbols.find(name); at != info.symbols.end())
        for (const uint32_t i : file->occurrences().Of(at->second))
          if (file->bindings.occurrences[i].binds()) found.push_back({info.file, file->bindings.occurrences[i].begin});
      if (const auto at = info.self_attributes.find(name); at != info.self_attributes.end())
        for (const uint32_t offset : at->second) found.push_back({info.file, offset});
      for (const MadeField& field : info.fields)
        if (info.call != kNoExpr && field.name == name) found.push_back({info.file, field.offset});
      break;
    }
    case Entity::kModule: {
      const FileId file = modules_[entity.a].file != kNoFile ? modules_[entity.a].file : modules_[entity.a].stub;
      if (file != kNoFile) found.push_back({file, 0});
      break;
    }
  }
  std::ranges::sort(found);
  found.erase(std::unique(found.begin(), found.end()), found.end());
  return found;
}

const std::vector<Binding>& Inference::DefinitionsOf(const SourceFile& file, uint32_t symbol) {
  static constexpr size_t kMost = 64;
  return definitions_.Get(file.id, symbol, [&] {
    std::vector<Binding> found;
    for (const uint32_t i : file.occurrences().Of(symbol)) {
      const Occurrence& occurrence = file.bindings.occurrences[i];
      const bool is_defined = occurrence.binds() && file.syntax.StatementNamedAt(occurrence.begin) != kModuleStmt;
      if (is_defined && found.size() < kMost) found.push_back({file.id, occurrence.begin});
    }
    return found;
  });
}

const std::vector<Binding>& Inference::BindingsAtEnd(const SourceFile& file, uint32_t symbol) {
  return at_end_.Get(file.id, symbol, [&] { return FindBindingsAtEnd(file, symbol); });
}

std::vector<Binding> Inference::FindBindingsAtEnd(const SourceFile& file, uint32_t symbol) {
  std::vector<uint32_t> own, elsewhere, reached;
  const NameSymbol& owner = file.bindings.symbols[symbol];
  for (const uint32_t i : file.occurrences().Of(symbol)) {
    const Occurrence& occurrence = file.bindings.occurrences[i];
    if (!occurrence.binds() || !IsReachable(file, file.syntax.StatementAt(occurrence.begin))) continue;
    (file.bindings.ScopeOf(occurrence) == owner.scope ? own : elsewhere).push_back(occurrence.begin);
  }
  DropImportsOfItself(file, own);
  const NameScopeKind kind = file.bindings.scopes[owner.scope].kind;
  if (kind == NameScopeKind::kModule || kind == NameScopeKind::kClass || kind == NameScopeKind::kFunction) {
    const std::function<int(ExprId)> truth = [&](ExprId condition) { return StaticTruth(file, condition); };
    Flow(file, own, truth).ReachEnd(file.StmtOfScope(owner.scope), reached);
  }
  if (reached.empty()) reached = own;
  reached.insert(reached.end(), elsewhere.begin(), elsewhere.end());
  std::vector<Binding> found;
  for (const uint32_t offset : reached) found.push_back({file.id, offset});
  return found;
}

const std::vector<Binding>& Inference::AnnotatedBindings(const SourceFile& file, uint32_t symbol) {
  const auto find = [&] {
    std::vector<Binding> found;
    for (const uint32_t i : file.occurrences().Of(symbol)) {
      const Occurrence& occurrence = file.bindings.occurrences[i];
      if (occurrence.kind != NameKind::kVariable) continue;
      const StmtId stmt = file.syntax.StatementAt(occurrence.begin);
      if (file.syntax.stmt(stmt).kind == StmtKind::kAnnotated && IsReachable(file, stmt))
        found.push_back({file.id, occurrence.begin});
    }
    return found;
  };
  return annotated_.Get(file.id, symbol, find);
}

}  // namespace quillet
