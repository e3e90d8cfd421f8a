// Work on many files, by this thread and another one.
#pragma once

#include <array>
#include <atomic>
#include <cstddef>
#include <exception>
#include <optional>
#include <thread>

namespace quillet {

// Calls `fn(i, worker)` for each number below `count`, by this thread with one worker and by another one with the
// other; by this one alone where there are fewer than `worth`. What one of them throws ends it, and is thrown.
template <class Worker, class Function>
void ForEachByThreads(size_t count, size_t worth, std::array<Worker, 2>& workers, Function&& fn) {
  std::atomic<size_t> next{0};
  const auto work = [&](Worker& worker) {
    try {
      for (size_t i = next++; i < count; i = next++) fn(i, worker);
    } catch (...) {
      next = count;
      throw;
    }
  };
  std::exception_ptr failure;
  std::optional<std::thread> helper;
  if (count >= worth) {
    try {
      helper.emplace([&] {
        try {
          work(workers[1]);
        } catch (...) {
          failure = std::current_exception();
        }
      });
    } catch (const std::exception&) {  // one thread does the same work
    }
  }
  try {
    work(workers[0]);
  } catch (...) {
    if (helper) helper->join();
    throw;
  }
  if (helper) helper->join();
  if (failure) std::rethrow_exception(failure);
}

}  // namespace quillet
