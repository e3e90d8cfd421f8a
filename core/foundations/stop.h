// How work that takes long is ended before its end.
//
// Nearly all work is short, and asking whether it is still wanted must cost nothing then. So what may take
// long says now and then how many steps it did (a step is what a token costs), and a question is asked only
// once enough of them have come together, some milliseconds' worth: that of the calling thread where it has
// one of its own, of the process otherwise. The answer "no" is an exception, Stopped, which no handler of the
// core takes for a failure of the work: whatever was under way is given back, as with any other exception.
// Without a question nothing ever stops.
#pragma once

#include <cstdint>
#include <functional>

namespace quillet {

// Not an Error, nor a std::exception: it says nothing of the work that it ends.
class Stopped {
 public:
  virtual ~Stopped() = default;
};

// Returns where work goes on, and throws Stopped or what derives from it where it ends.
using StopQuestion = std::function<void()>;

// The question of all threads that have none of their own. To be set before there is work.
void SetStopQuestion(void (*ask)());

// A question of the calling thread while this lives, asked in front of those that it has already.
class ThreadStopQuestion {
 public:
  explicit ThreadStopQuestion(StopQuestion ask);
  ~ThreadStopQuestion();
  ThreadStopQuestion(const ThreadStopQuestion&) = delete;
  ThreadStopQuestion& operator=(const ThreadStopQuestion&) = delete;

 private:
  friend void AskWhetherToStop();

  StopQuestion ask_;
  const ThreadStopQuestion* const before_;
};

// Asks at once: for what waits.
void AskWhetherToStop();

// So many bytes that are written cost a step.
inline constexpr int64_t kBytesAStep = 16;

// How many steps a loop may do between two calls of CountSteps.
inline constexpr int64_t kStepsBetweenQuestions = int64_t{1} << 16;

namespace stop {
inline constinit thread_local int64_t steps_left = kStepsBetweenQuestions;
}

// To be called by what may take long, with the steps done since the last call or about to be done.
inline void CountSteps(int64_t steps) {
  stop::steps_left -= steps;
  if (stop::steps_left < 0) [[unlikely]]
    AskWhetherToStop();
}

}  // namespace quillet
