// What Python holds of a file's names: the core's numbers, and a str for each text that was asked for.
#pragma once

#include <memory>
#include <optional>
#include <utility>

#include "bindings/rows.h"
#include "names/bindings.h"

namespace quillet::host {

class FileNames {
 public:
  explicit FileNames(std::shared_ptr<const Bindings> bindings) : bindings_(std::move(bindings)) {}
  FileNames(const FileNames&) = delete;
  FileNames& operator=(const FileNames&) = delete;

  const Bindings& bindings() const { return *bindings_; }

  // Occurrences from `begin` up to `end` as instances of a class that derives from tuple, with the host's
  // own objects for roles, kinds (the first is that of no kind), flags by their number, and symbols.
  nb::list Occurrences(size_t begin, size_t end, nb::handle row_class, const nb::tuple& roles, const nb::tuple& kinds,
                       const nb::tuple& flags, const nb::list& symbols);
  // A tuple (name, scope, answers, is_listed, index of the symbol that owns the variable) a symbol; `answers`
  // has a bit a question, in the order of SYMBOL_QUESTIONS.
  nb::list Symbols();
  // Scopes as instances of a class that derives from tuple.
  nb::list Scopes(nb::handle row_class, const nb::tuple& kinds, const nb::list& symbols);
  // The indices of a symbol's occurrences.
  nb::tuple OccurrencesOf(size_t symbol);

 private:
  nb::object TextOf(uint32_t index) { return index == kNoIndex ? nb::object(nb::str("")) : texts_[index]; }

  std::shared_ptr<const Bindings> bindings_;
  ShownTexts texts_{bindings_->texts};
  std::optional<OccurrencesOfSymbols> of_symbols_;
};

}  // namespace quillet::host
