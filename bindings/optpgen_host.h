// What the sibling optpgen shares with the parser's binding: the converter's base class and the
// grammar object.
#pragma once

#include <memory>

#include "bindings/bindings.h"
#include "grammar/grammar.h"

namespace quillet::host {

// optpgen.NodeConverter: an object with one operation, convert. A Python subclass overrides it; the
// classes of this module that derive from it have theirs bound.
struct NodeConverter {};

// The grammar object that ParserGenerator.make_grammar gives, and that a parser shows as _fGrammar.
struct GrammarObject {
  std::shared_ptr<const Grammar> grammar;
  nb::object symbol2number{};  // dicts, made when read
  nb::object number2symbol{};
};

}  // namespace quillet::host
