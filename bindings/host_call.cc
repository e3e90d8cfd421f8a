// What was given up in the middle of operations, until the last of them is over. See host_call.h.
#include "bindings/host_call.h"

#include <string>
#include <vector>

#include "tree/node_pool.h"

namespace quillet::host {
namespace {

using Kept = std::vector<std::shared_ptr<const void>>;

Kept& TheKept() {
  static auto* kept = new Kept;  // outlives the interpreter's last objects
  return *kept;
}

const bool g_tells_when_the_core_waits = [] {
  NodePool::is_core_waiting = &IsUnderWay;
  return true;
}();

}  // namespace

void under_way::Release() {
  // While some of it goes, the host's code runs, and may begin operations that give up more.
  while (!TheKept().empty() && !IsUnderWay()) {
    keeps_something = false;
    const Kept gone = std::exchange(TheKept(), {});
  }
}

void KeepForOperation(std::shared_ptr<const void> thing) {
  TheKept().push_back(std::move(thing));
  under_way::keeps_something = true;
}

void OneThread::ThrowInUse(const char* what) {
  ThrowError(ErrorKind::kRuntimeError, std::string(what) + " is in use by another thread");
}

}  // namespace quillet::host
