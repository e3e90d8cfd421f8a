// The objects behind CDispatchWalker and CTypeHintWalker.
#pragma once

#include <memory>
#include <utility>

#include "bindings/bindings.h"
#include "bindings/walker_object.h"
#include "hints/hint_walker.h"

namespace quillet::host {

struct DispatchObject {
  std::shared_ptr<CDispatchWalker> walker;
  nb::object dispatch_dict;  // the host's dict, or made when read
  HandedInLine handed_in;    // during a walk of the host's its line
};

struct HintWalkerObject : DispatchObject {
  CTypeHintWalker& hints() const { return static_cast<CTypeHintWalker&>(*walker); }
  nb::object general_node_walker;  // a CNodeWalker object or None; keeps the walker alive
  nb::object hint_parser;          // made when read, as are the converters
  nb::object name_conv;
  nb::object hint_conv;
  nb::object version_triple;
};

inline constexpr const char* kTheWalker = "the walker";

// Around a walk of the host's: the object keeps the line as long as the walk is on it, so that visits
// see the host's own line.
class WalkOfHost {
 public:
  WalkOfHost(DispatchObject& object, nb::handle logical)
      : object_(object), outer_(std::exchange(object.handed_in.line, nb::borrow(logical))) {}
  ~WalkOfHost() {
    // The end of a walk leaves the walker without a line, whatever the host handed in meanwhile; only
    // where there was nothing to walk it keeps what it had.
    object_.handed_in.Replace(object_.walker->fLogical == nullptr ? nb::object() : std::exchange(outer_, {}));
    if (outer_.is_valid()) LetGo(std::move(outer_));
  }
  WalkOfHost(const WalkOfHost&) = delete;
  WalkOfHost& operator=(const WalkOfHost&) = delete;

 private:
  DispatchObject& object_;
  nb::object outer_;
};

// Tested before anything of the walker changes.
inline void RefuseSecondWalk(const DispatchObject& object) {
  if (object.walker->fLogical != nullptr)
    ThrowError(ErrorKind::kValueError, "Only one logical may be walked at a time");
}

// For the collector, also of what is derived from it.
int TraverseDispatch(PyObject* self, visitproc visit, void* arg);
int ClearDispatch(PyObject* self);

nb::object NewHintWalkerObject(std::shared_ptr<CTypeHintWalker> walker, nb::object general_node_walker,
                               nb::object version_triple);

}  // namespace quillet::host
