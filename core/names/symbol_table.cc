// Symbols by scope and name, and what names are called.
#include "names/symbol_table.h"

#include <algorithm>
#include <bit>

namespace quillet {

void SymbolTable::Begin(size_t size, size_t names, NameNormalizer normalizer) {
  normalizer_ = normalizer;
  texts_.Begin(names / 4);
  notes_.clear();
  mangled_.clear();
  mangle_budget_ = std::max(kSmallestMangleBudget, 4 * size);
  const size_t count = std::bit_ceil(std::max<size_t>(names, 64));
  if (slots_.size() < count) slots_.resize(count);
  std::fill_n(slots_.begin(), count, kNoIndex);
  mask_ = count - 1;
}

uint32_t SymbolTable::Open(const NewScope& scope) {
  const auto index = static_cast<uint32_t>(out_.scopes.size());
  out_.scopes.push_back({scope.parent, scope.name, kNoIndex, 0, scope.begin, scope.begin, scope.kind, scope.is_listed,
                         scope.is_async, false, scope.is_generator, scope.sees_class});
  Note note;
  note.walrus_scope = index;
  if (scope.parent != kNoIndex) {
    if (scope.kind == NameScopeKind::kComprehension) note.walrus_scope = notes_[scope.parent].walrus_scope;
    note.private_class = notes_[scope.parent].private_class;
    note.mangled_parameters = notes_[scope.parent].mangled_parameters;
  }
  if (scope.is_private) {
    note.private_class = scope.name;
    const bool is_body = scope.kind == NameScopeKind::kClass;
    note.mangled_parameters = is_body || !version_.AtLeast(3, 13) ? kNoIndex : index;
  }
  notes_.push_back(note);
  return index;
}

uint32_t SymbolTable::Find(uint32_t scope, uint32_t name) const {
  for (size_t at = SlotOf(scope, name);; at = (at + 1) & mask_) {
    const uint32_t found = slots_[at];
    if (found == kNoIndex) return kNoIndex;
    if (out_.symbols[found].scope == scope && out_.symbols[found].name == name) return found;
  }
}

uint32_t SymbolTable::SymbolNamed(uint32_t scope, uint32_t name) {
  size_t at = SlotOf(scope, name);
  for (;; at = (at + 1) & mask_) {
    const uint32_t found = slots_[at];
    if (found == kNoIndex) break;
    if (out_.symbols[found].scope == scope && out_.symbols[found].name == name) return found;
  }
  const uint32_t symbol = AddSymbol(scope, name);
  slots_[at] = symbol;
  if (2 * out_.symbols.size() > mask_) GrowSlots();
  return symbol;
}

// Appends a symbol to its scope, and does not enter it into the table.
uint32_t SymbolTable::AddSymbol(uint32_t scope, uint32_t name) {
  const auto symbol = static_cast<uint32_t>(out_.symbols.size());
  out_.symbols.push_back({name, scope, symbol, kNoIndex, 0, NameSymbol::Resolution::kLocal, false});
  Note& note = notes_[scope];
  if (note.last_symbol == kNoIndex)
    out_.scopes[scope].first_symbol = symbol;
  else
    out_.symbols[note.last_symbol].next = symbol;
  note.last_symbol = symbol;
  ++out_.scopes[scope].symbol_count;
  return symbol;
}

void SymbolTable::GrowSlots() {
  const size_t count = 2 * (mask_ + 1);
  if (slots_.size() < count) slots_.resize(count);
  std::fill_n(slots_.begin(), count, kNoIndex);
  mask_ = count - 1;
  for (uint32_t symbol = 0; symbol < out_.symbols.size(); ++symbol) {
    size_t at = SlotOf(out_.symbols[symbol].scope, out_.symbols[symbol].name);
    while (slots_[at] != kNoIndex) at = (at + 1) & mask_;
    slots_[at] = symbol;
  }
}

uint32_t SymbolTable::SpecialSymbolOf(uint32_t scope, uint32_t text) {
  const uint32_t symbol = SymbolNamed(scope, NameInScope(scope, text));
  texts_[text].last_scope = scope;
  texts_[text].last_symbol = symbol;
  return symbol;
}

uint32_t SymbolTable::TypeParameterOf(uint32_t scope, uint32_t text) {
  uint32_t name = NormalForm(text);
  const uint32_t class_name = notes_[scope].private_class;
  if ((texts_[name].form & TextTable::kPrivate) != 0 && class_name != kNoIndex) name = Mangle(class_name, name);
  const uint32_t symbol = SymbolNamed(scope, name);
  texts_[text].last_scope = scope;
  texts_[text].last_symbol = symbol;
  return symbol;
}

uint32_t SymbolTable::NormalForm(uint32_t text) {
  if ((texts_[text].form & TextTable::kNotAscii) == 0 || normalizer_ == nullptr) return text;
  buffer_.clear();
  return normalizer_(texts_.TextOf(text), buffer_) && !buffer_.empty() ? texts_.NumberOfCopy(buffer_) : text;
}

uint32_t SymbolTable::NameInScope(uint32_t scope, uint32_t text) {
  text = NormalForm(text);
  const Note& note = notes_[scope];
  if ((texts_[text].form & TextTable::kPrivate) == 0 || note.private_class == kNoIndex) return text;
  const uint32_t mangled = Mangle(note.private_class, text);
  if (note.mangled_parameters == kNoIndex) return mangled;
  const uint32_t found = Find(note.mangled_parameters, mangled);
  const bool is_parameter = found != kNoIndex && (out_.symbols[found].uses & NameSymbol::kTypeParameter) != 0;
  return is_parameter ? mangled : text;
}

// `__x` in the class `_Shop` is `_Shop__x`, and what it is in a class whose name is all underscores.
uint32_t SymbolTable::Mangle(uint32_t class_name, uint32_t text) {
  const uint64_t key = uint64_t{class_name} << 32 | text;
  if (const auto found = mangled_.find(key); found != mangled_.end()) return found->second;
  const Text name = texts_.TextOf(class_name);
  const Text own_name = name.substr(std::min(name.find_first_not_of('_'), name.size()));
  const size_t size = own_name.size() + texts_[text].size + 1;
  uint32_t mangled = text;
  // Long names in classes of long names could make more text than the source has.
  if (!own_name.empty() && size <= mangle_budget_) {
    mangle_budget_ -= size;
    buffer_.assign(1, '_').append(own_name).append(texts_.TextOf(text));
    mangled = texts_.NumberOfCopy(buffer_);
  }
  mangled_.emplace(key, mangled);
  return mangled;
}

}  // namespace quillet
