// The object behind CNodeWalker: one of the host's making, or an analyzer's.
#pragma once

#include <memory>

#include "quillet/tarvex/bindings.h"
#include "walker/walker.h"

namespace quillet::host {

struct WalkerObject {
  std::shared_ptr<CNodeWalker> walker;
  nb::object to_text;  // made when read
  nb::object logical;  // the line that the host handed in
};

nb::object NewWalkerObject(std::shared_ptr<CNodeWalker> walker);
nb::object NewConverterObject(std::shared_ptr<CNodeToTextConverter> converter);

// The CLogicalLine that a walk is on, None between walks: the one that the host handed in, or the
// one that sees the core's operations on it (code of the host's runs within a walk only by these).
nb::object HostLineOf(LogicalLine* line, const nb::object& handed_in);
// Hands in a CLogicalLine, or takes it back with None: `line` is the walker's field, `handed_in` its owner.
void SetHostLine(nb::handle value, LogicalLine*& line, nb::object& handed_in);

}  // namespace quillet::host
