// The object behind CNodeWalker: one of the host's making, or an analyzer's.
#pragma once

#include <memory>
#include <utility>

#include "bindings/bindings.h"
#include "bindings/host_call.h"
#include "bindings/line_object.h"
#include "walker/walker.h"

namespace quillet::host {

// The line that the host handed in to a walker. One that it replaces meanwhile stays for as long as an operation may be
// on it.
struct HandedInLine {
  nb::object line;

  // The line of the walker becomes `value`, a CLogicalLine or None; `set` tells it to the walker.
  template <class Set>
  void HandIn(nb::handle value, Set&& set) {
    LineObject* object = value.is_none() ? nullptr : &LineOf(value);
    if (object != nullptr) object->BeginWriting();
    nb::object next = object == nullptr ? nb::object() : nb::borrow(value);
    set(object == nullptr ? nullptr : &object->line());
    // Letting go of a line may run the host's code, so it comes last.
    Replace(std::move(next));
  }
  void Replace(nb::object next) {
    nb::object old = std::exchange(line, std::move(next));
    if (old.is_valid()) LetGo(std::move(old));
  }
};

struct WalkerObject {
  std::shared_ptr<CNodeWalker> walker;
  nb::object to_text;  // made when read
  HandedInLine handed_in;
};

nb::object NewWalkerObject(std::shared_ptr<CNodeWalker> walker);
nb::object NewConverterObject(std::shared_ptr<CNodeToTextConverter> converter);

// The CLogicalLine that a walk is on, None between walks: the one that the host handed in, or the
// one that sees the core's operations on it (code of the host's runs within a walk only by these).
nb::object HostLineOf(LogicalLine* line, const HandedInLine& handed_in);

}  // namespace quillet::host
