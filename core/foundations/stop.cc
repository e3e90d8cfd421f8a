// Who is asked whether work is still wanted.
#include "foundations/stop.h"

#include <atomic>
#include <utility>

namespace quillet {

namespace {

std::atomic<void (*)()> process_question{nullptr};
constinit thread_local const ThreadStopQuestion* thread_question = nullptr;

}  // namespace

void SetStopQuestion(void (*ask)()) { process_question.store(ask, std::memory_order_release); }

ThreadStopQuestion::ThreadStopQuestion(StopQuestion ask)
    : ask_(std::move(ask)), before_(std::exchange(thread_question, this)) {}
ThreadStopQuestion::~ThreadStopQuestion() { thread_question = before_; }

void AskWhetherToStop() {
  stop::steps_left = kStepsBetweenQuestions;
  if (thread_question == nullptr) {
    if (const auto ask = process_question.load(std::memory_order_acquire)) ask();
    return;
  }
  for (const ThreadStopQuestion* question = thread_question; question != nullptr; question = question->before_)
    question->ask_();
}

}  // namespace quillet
