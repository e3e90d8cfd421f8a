// The objects behind CDispatchWalker and CTypeHintWalker.
#pragma once

#include <memory>

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

nb::object NewHintWalkerObject(std::shared_ptr<CTypeHintWalker> walker, nb::object general_node_walker,
                               nb::object version_triple);

}  // namespace quillet::host
