// The clock in use is one atomic function pointer.
#include "tokens/clock.h"

#include <atomic>
#include <chrono>

namespace quillet {

namespace {

double SystemSeconds() {
  return std::chrono::duration<double>(std::chrono::system_clock::now().time_since_epoch()).count();
}

std::atomic<TimeFunc> the_clock{SystemSeconds};

}  // namespace

void SetTimeFunc(TimeFunc clock) { the_clock = clock != nullptr ? clock : SystemSeconds; }

double GetNowTime() { return the_clock.load()(); }

bool OutOfTime(double end_time) { return GetNowTime() >= end_time; }

}  // namespace quillet
