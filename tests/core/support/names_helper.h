// Bindings as short text, for tests: one word an occurrence, in the order of the source,
//   text=role[/kind][+flag...][<receiver][@scope][^owner]
// The scope is named where it is not the module, and the owner of the variable where it is another scope.
#pragma once

#include <string>

#include "names/binder.h"

namespace quillet::testing {

inline std::string ScopeWord(const Bindings& bindings, uint32_t index) {
  const NameScope& scope = bindings.scopes[index];
  if (scope.kind == NameScopeKind::kTypeParameters) return "[" + std::string(bindings.NameOf(scope)) + "]";
  if (scope.kind == NameScopeKind::kAnnotation) return "annotation";
  if (scope.kind == NameScopeKind::kClass || scope.kind == NameScopeKind::kFunction)
    return scope.name == kNoIndex ? "?" : std::string(bindings.texts[scope.name]);
  return std::string(NameScopeKindWords()[static_cast<size_t>(scope.kind)]);
}

inline std::string OccurrenceWord(const Bindings& bindings, uint32_t index) {
  const Occurrence& occurrence = bindings.occurrences[index];
  std::string word(bindings.TextOf(occurrence));
  word.append("=").append(NameRoleWords()[static_cast<size_t>(occurrence.role)]);
  if (occurrence.kind != NameKind::kNone)
    word.append("/").append(NameKindWords()[static_cast<size_t>(occurrence.kind) - 1]);
  for (size_t bit = 0; bit < NameFlagWords().size(); ++bit)
    if ((occurrence.flags >> bit & 1) != 0) word.append("+").append(NameFlagWords()[bit]);
  if (const uint32_t receiver = bindings.ReceiverOf(index); receiver != kNoIndex)
    word.append("<").append(bindings.TextOf(bindings.occurrences[receiver]));
  else if (occurrence.is_attribute)
    word.append("<");
  const uint32_t scope = bindings.ScopeOf(occurrence);
  if (scope != 0) word.append("@").append(ScopeWord(bindings, scope));
  const uint32_t variable = bindings.VariableOf(occurrence);
  if (variable != kNoIndex && bindings.symbols[variable].scope != scope)
    word.append("^").append(ScopeWord(bindings, bindings.symbols[variable].scope));
  return word;
}

inline std::string NamesOf(const Bindings& bindings) {
  std::string words;
  for (uint32_t i = 0; i < bindings.occurrences.size(); ++i)
    words.append(i == 0 ? "" : " ").append(OccurrenceWord(bindings, i));
  return words;
}

inline std::string NamesOf(Text source, Version version = Version::Of(3, 13)) {
  NameBinder binder(version);
  return NamesOf(binder.Bind(source));
}

// The listed symbols of a scope: name, and a letter for each question that symtable answers with yes:
// parameter, global, declared global (d), nonlocal, local, free, imported, assigned, referenced,
// annotated (t), namespace (s).
inline std::string SymbolsOf(const Bindings& bindings, uint32_t scope) {
  std::string words;
  for (uint32_t i = bindings.scopes[scope].first_symbol; i != kNoIndex; i = bindings.symbols[i].next) {
    const NameSymbol& symbol = bindings.symbols[i];
    if (!symbol.is_listed) continue;
    if (!words.empty()) words += ' ';
    words.append(bindings.texts[symbol.name]).append(":");
    const auto add = [&words](bool answer, char letter) {
      if (answer) words += letter;
    };
    add(bindings.IsParameter(symbol), 'p');
    add(bindings.IsGlobal(symbol), 'g');
    add(bindings.IsDeclaredGlobal(symbol), 'd');
    add(bindings.IsNonlocal(symbol), 'n');
    add(bindings.IsLocal(symbol), 'l');
    add(bindings.IsFree(symbol), 'f');
    add(bindings.IsImported(symbol), 'i');
    add(bindings.IsAssigned(symbol), 'a');
    add(bindings.IsReferenced(symbol), 'r');
    add(bindings.IsAnnotated(symbol), 't');
    add(bindings.IsNamespace(symbol), 's');
  }
  return words;
}

}  // namespace quillet::testing
