// The time, for callers that want a deadline. Nothing in an analysis asks for it.
#pragma once

namespace quillet {

// A clock gives seconds since the epoch and may throw.
using TimeFunc = double (*)();

// The clock in use; a host or a test may put another in its place. nullptr brings the system's back.
void SetTimeFunc(TimeFunc clock);

double GetNowTime();

// Whether the time has come: the very moment counts as out of time.
bool OutOfTime(double end_time);

}  // namespace quillet
