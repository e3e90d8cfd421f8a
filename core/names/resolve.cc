// Which scope owns each name, by the language's rules, for all scopes in one walk from the outside in.
//
// By name there is one place that says what a nested scope sees: the symbol of the nearest function
// around that binds it, or none where a `global` statement hides it. A scope puts its own names there
// when the walk enters it and takes them back when the walk leaves. So a look-up costs the same
// however deep functions nest.
// A function that lies between the use of a free variable and its owner has a symbol for it, too, though
// it never mentions the name. There may be many such functions around many such names, so their
// number has a bound.
#include <algorithm>

#include "names/symbol_table.h"

namespace quillet {

namespace {

constexpr Text kClassCell = "__class__";

}  // namespace

void SymbolTable::Resolve() {
  const auto scope_count = static_cast<uint32_t>(out_.scopes.size());
  for (uint32_t scope = scope_count; scope-- > 1;) {
    Note& around = notes_[out_.scopes[scope].parent];
    notes_[scope].next_sibling = around.first_child;
    around.first_child = scope;
  }
  visible_.assign(texts_.size(), kNoIndex);
  shadowed_.clear();

  // A scope that was entered, and how much it shadows is behind `shadowed`.
  struct Entered {
    uint32_t scope;
    size_t shadowed;
  };
  std::vector<Entered> open;
  const auto enter = [&](uint32_t scope) {
    open.push_back({scope, shadowed_.size()});
    ResolveScope(scope);
    PublishScope(scope);
  };
  enter(0);
  while (!open.empty()) {
    const Entered top = open.back();
    const uint32_t child = notes_[top.scope].first_child;
    if (child != kNoIndex) {
      notes_[top.scope].first_child = notes_[child].next_sibling;
      enter(child);
      continue;
    }
    while (shadowed_.size() > top.shadowed) {
      visible_[shadowed_.back().name] = shadowed_.back().symbol;
      shadowed_.pop_back();
    }
    open.pop_back();
  }
  PassThrough();
  MarkNamespaces();
  texts_.CopyTo(out_.texts);
}

void SymbolTable::ResolveScope(uint32_t scope) {
  // To annotation and type parameter scopes of a class its names are visible.
  uint32_t class_around = kNoIndex;
  if (out_.scopes[scope].sees_class) {
    class_around = out_.scopes[scope].parent;
    while (out_.scopes[class_around].kind != NameScopeKind::kClass && out_.scopes[class_around].sees_class)
      class_around = out_.scopes[class_around].parent;
    if (out_.scopes[class_around].kind != NameScopeKind::kClass) class_around = kNoIndex;
  }
  for (uint32_t symbol = out_.scopes[scope].first_symbol; symbol != kNoIndex; symbol = out_.symbols[symbol].next)
    ResolveSymbol(symbol, class_around);
}

void SymbolTable::ResolveSymbol(uint32_t index, uint32_t class_around) {
  using Resolution = NameSymbol::Resolution;
  const auto settle = [this, index](Resolution resolution, uint32_t variable) {
    NameSymbol& symbol = out_.symbols[index];
    symbol.resolution = resolution;
    symbol.variable = variable;
    symbol.is_listed = symbol.uses != 0;
  };
  const NameSymbol& symbol = out_.symbols[index];
  const uint32_t name = symbol.name;
  const uint32_t seen = visible_[name];
  if ((symbol.uses & NameSymbol::kGlobalStatement) != 0) return settle(Resolution::kExplicitGlobal, ModuleSymbol(name));
  if ((symbol.uses & NameSymbol::kNonlocalStatement) != 0)
    // Without a binding around, which is an error, the name stays where it is.
    return settle(Resolution::kFree, seen != kNoIndex ? seen : index);
  if (Bindings::IsBound(symbol)) return settle(Resolution::kLocal, index);
  if (class_around != kNoIndex) {
    if (const uint32_t found = Find(class_around, name); found != kNoIndex) {
      const NameSymbol& of_class = out_.symbols[found];
      if ((of_class.uses & NameSymbol::kGlobalStatement) != 0)
        return settle(Resolution::kExplicitGlobal, of_class.variable);
      if (Bindings::IsBound(of_class) && (of_class.uses & NameSymbol::kNonlocalStatement) == 0)
        return settle(Resolution::kImplicitGlobal, found);
    }
  }
  if (seen != kNoIndex) return settle(Resolution::kFree, seen);
  settle(Resolution::kImplicitGlobal, ModuleSymbol(name));
}

// What nested scopes see of a scope: of a function what it binds, of a class the cell of the class alone.
void SymbolTable::PublishScope(uint32_t scope) {
  const auto publish = [this](uint32_t name, uint32_t symbol) {
    shadowed_.push_back({name, visible_[name]});
    visible_[name] = symbol;
  };
  if (scope == 0) return;
  if (out_.scopes[scope].kind == NameScopeKind::kClass) {
    if (version_.AtLeast(3, 0)) {
      if (const uint32_t name = texts_.Find(kClassCell); name != kNoIndex) publish(name, AddSymbol(scope, name));
    }
    return;
  }
  for (uint32_t index = out_.scopes[scope].first_symbol; index != kNoIndex; index = out_.symbols[index].next) {
    const NameSymbol& symbol = out_.symbols[index];
    if (symbol.resolution == NameSymbol::Resolution::kLocal)
      publish(symbol.name, index);
    else if ((symbol.uses & NameSymbol::kGlobalStatement) != 0)
      publish(symbol.name, kNoIndex);
  }
}

// The module's symbol for a global name; one that is not listed where the module does not mention it.
uint32_t SymbolTable::ModuleSymbol(uint32_t name) {
  const size_t count = out_.symbols.size();
  const uint32_t symbol = SymbolNamed(0, name);
  if (out_.symbols.size() != count) out_.symbols[symbol].resolution = NameSymbol::Resolution::kImplicitGlobal;
  return symbol;
}

void SymbolTable::PassThrough() {
  using Resolution = NameSymbol::Resolution;
  const auto count = static_cast<uint32_t>(out_.symbols.size());
  size_t budget = out_.occurrences.size() + 1024;
  for (uint32_t index = 0; index < count; ++index) {
    const NameSymbol free = out_.symbols[index];
    if (free.resolution != Resolution::kFree || !free.is_listed || !out_.scopes[free.scope].is_listed) continue;
    if (free.variable == index) continue;
    const uint32_t owner = out_.symbols[free.variable].scope;
    for (uint32_t scope = out_.scopes[free.scope].parent; scope != owner; scope = out_.scopes[scope].parent) {
      uint32_t found = Find(scope, free.name);
      if (found == kNoIndex) {
        if (budget == 0) return;
        --budget;
        found = SymbolNamed(scope, free.name);
        out_.symbols[found].variable = free.variable;
        out_.symbols[found].resolution = Resolution::kFree;
      }
      NameSymbol& passed = out_.symbols[found];
      if (passed.resolution == Resolution::kFree) {
        // One that is listed finds its way by itself, or another did it.
        if (passed.is_listed) break;
        passed.is_listed = true;
      } else {
        // A class has a name of its own, which nested functions do not see.
        if ((passed.uses & NameSymbol::kPassedBy) != 0) break;
        passed.uses |= NameSymbol::kPassedBy;
      }
    }
  }
}

// The scope of type parameters holds that of the definition, of the same name, whoever mentions it there.
void SymbolTable::MarkNamespaces() {
  for (uint32_t scope = 0; scope < out_.scopes.size(); ++scope) {
    const NameScope& parameters = out_.scopes[scope];
    if (parameters.kind != NameScopeKind::kTypeParameters || parameters.name == kNoIndex) continue;
    const uint32_t found = Find(scope, parameters.name);
    if (found != kNoIndex && out_.symbols[found].is_listed) out_.symbols[found].uses |= NameSymbol::kNamespace;
  }
}

}  // namespace quillet
