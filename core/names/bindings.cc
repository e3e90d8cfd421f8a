// Places, words, and the occurrences sorted by their symbols.
#include "names/bindings.h"

#include <algorithm>
#include <utility>

#include "foundations/shown_text.h"

namespace quillet {

namespace {

constexpr Text kRoleWords[] = {
#define QUILLET_NAME_ROLE(identifier, word) word,
#include "names/words.def"
};
constexpr Text kKindWords[] = {
#define QUILLET_NAME_KIND(identifier, word) word,
#include "names/words.def"
};
constexpr Text kScopeKindWords[] = {
#define QUILLET_NAME_SCOPE_KIND(identifier, word) word,
#include "names/words.def"
};
constexpr Text kFlagWords[] = {
#define QUILLET_NAME_FLAG(identifier, number, word) word,
#include "names/words.def"
};

template <class T>
size_t BytesOf(const std::vector<T>& items) {
  return items.capacity() * sizeof(T);
}

}  // namespace

std::span<const Text> NameRoleWords() { return kRoleWords; }
std::span<const Text> NameKindWords() { return kKindWords; }
std::span<const Text> NameScopeKindWords() { return kScopeKindWords; }
std::span<const Text> NameFlagWords() { return kFlagWords; }

Position Bindings::PositionOf(uint32_t offset) const {
  const auto next = std::upper_bound(line_starts.begin(), line_starts.end(), offset);
  // A byte order mark stands in front of the first line.
  if (next == line_starts.begin()) return {0, 0};
  return {static_cast<int32_t>(next - line_starts.begin()) - 1, static_cast<int32_t>(offset - *(next - 1))};
}

bool Bindings::IsGlobal(const NameSymbol& symbol) const {
  if (symbol.resolution == NameSymbol::Resolution::kExplicitGlobal ||
      symbol.resolution == NameSymbol::Resolution::kImplicitGlobal) {
    return true;
  }
  return !is_python2 && symbol.scope == 0 && IsBound(symbol);
}

bool Bindings::IsLocal(const NameSymbol& symbol) const {
  if (is_python2) return IsBound(symbol);
  return symbol.resolution == NameSymbol::Resolution::kLocal || (symbol.scope == 0 && IsBound(symbol));
}

size_t Bindings::ByteSize() const {
  return BytesOf(occurrences) + BytesOf(scopes) + BytesOf(symbols) + BytesOf(line_starts) + BytesOf(texts.offsets) +
         texts.bytes.capacity();
}

void Bindings::Clear() {
  occurrences.clear();
  scopes.clear();
  symbols.clear();
  texts.offsets.assign(1, 0);
  texts.bytes.clear();
  line_starts.clear();
}

std::vector<std::string> QualifiedNames(const Bindings& bindings) {
  std::vector<std::string> names;
  for (const NameScope& scope : bindings.scopes) {
    std::string name = scope.parent == kNoIndex ? std::string() : names[scope.parent];
    if (scope.kind == NameScopeKind::kClass || scope.kind == NameScopeKind::kFunction) {
      if (!name.empty()) name += '.';
      AppendShown(bindings.NameOf(scope), name);
    }
    names.push_back(std::move(name));
  }
  return names;
}

OccurrencesOfSymbols::OccurrencesOfSymbols(const Bindings& bindings) : begins_(bindings.symbols.size() + 1) {
  // A symbol that does not own its variable is in two lists: its own and the owner's.
  const auto visit = [&bindings](auto&& add) {
    for (uint32_t i = 0; i < bindings.occurrences.size(); ++i) {
      const Occurrence& occurrence = bindings.occurrences[i];
      if (!occurrence.has_symbol) continue;
      const uint32_t variable = bindings.symbols[occurrence.place].variable;
      add(occurrence.place, i);
      if (variable != occurrence.place) add(variable, i);
    }
  };
  visit([this](uint32_t symbol, uint32_t) { ++begins_[symbol + 1]; });
  for (size_t i = 1; i < begins_.size(); ++i) begins_[i] += begins_[i - 1];
  indices_.resize(begins_.back());
  std::vector<uint32_t> next(begins_.begin(), begins_.end() - 1);
  visit([&](uint32_t symbol, uint32_t index) { indices_[next[symbol]++] = index; });
}

}  // namespace quillet
