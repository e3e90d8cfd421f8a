// The object behind CNodeWalker: one of the host's making, or an analyzer's.
#pragma once

#include <memory>
#include <utility>
#include <vector>

#include "bindings/bindings.h"
#include "bindings/errors.h"
#include "bindings/line_object.h"
#include "walker/walker.h"

namespace quillet::host {

// The line that the host handed in to a walker, and those that it handed in before while the core was
// in the middle of an operation, which may still be on one of them.
struct HandedInLine {
  nb::object line;
  std::vector<nb::object> replaced;

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
  void Replace(nb::object next) { LetGo(std::exchange(line, std::move(next))); }
  void LetGo(nb::object old) {
    if (!HostCall::IsUnderWay()) {
      std::vector<nb::object> gone = std::exchange(replaced, {});
    } else if (old.is_valid()) {
      replaced.push_back(std::move(old));
    }
  }

  int Traverse(visitproc visit, void* arg) const {
    Py_VISIT(line.ptr());
    for (const nb::object& old : replaced) Py_VISIT(old.ptr());
    return 0;
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
