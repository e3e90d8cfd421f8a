// Many files at once: paths in, records (or the lines of an output format) out, in the order of the
// paths whatever the number of threads.
//
// Each thread has an analyzer of its own and takes the next file that nobody has; nothing is shared
// but the list and the results. How far threads run ahead of the reader is bounded, in files and in
// bytes, so that memory does not grow with the list. No file fails the batch: one that cannot be read
// is a result that says why. Where no thread can be had, the reader's does the work. A process that forks
// has two batches from then on: both hand out what is left.
#pragma once

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <functional>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <thread>
#include <vector>

#include "analysis/file_worker.h"
#include "foundations/stop.h"

namespace quillet {

class BatchAnalyzer {
 public:
  struct Options : FileWorker::Options {
    unsigned jobs = 0;  // 0 stands for one a core
    // Results that may wait for the reader, and the bytes that they may hold.
    size_t most_waiting = 64;
    size_t most_waiting_bytes = size_t{256} << 20;
    // Made by each thread of the batch in front of its work, and let go of by it at the end.
    std::function<std::shared_ptr<void>()> make_thread_state;
  };

  BatchAnalyzer(Options options, std::vector<BatchInput> inputs);
  // Cancels what was not handed out.
  ~BatchAnalyzer();
  BatchAnalyzer(const BatchAnalyzer&) = delete;
  BatchAnalyzer& operator=(const BatchAnalyzer&) = delete;

  const std::vector<BatchInput>& inputs() const { return inputs_; }

  // Sets the threads to work in front of the first Next, which does so otherwise.
  void Start() { TheRing().Start(); }

  enum class Wait { kResult, kEnd, kTimeout };
  // The next result in order. kEnd behind the last one and after Cancel. Where no thread could be
  // started, this one does the work, however long that takes; Stopped ends it (stop.h), and the file is
  // begun anew by the next call. For any number of threads.
  Wait Next(BatchResult& result, std::chrono::milliseconds patience);
  // The same, however long it takes; false at the end.
  bool Next(BatchResult& result);

  // Stops, in the middle of a file as well, and waits for that. For any thread but those of the batch.
  void Cancel();

  // Ends the threads, for good: the reader does the work that is left. For a process that is about to lose what
  // the threads need.
  void DismissThreads();

 private:
  // The threads, and the results that wait for the reader.
  class Ring {
   public:
    Ring(BatchAnalyzer& batch, bool reader_works);
    ~Ring();
    Ring(const Ring&) = delete;
    Ring& operator=(const Ring&) = delete;

    void Start();
    Wait Next(BatchResult& result, std::chrono::milliseconds patience);
    void Cancel();
    // Cancels it for another ring that takes its place.
    void Dismiss();
    bool is_dismissed() const { return dismissed_; }
    bool IsOfThisProcess() const;

   private:
    void StartThreads();
    void Work();
    StopQuestion IsWanted() const;
    // The next result, worked out by the calling thread.
    Wait NextByReader(BatchResult& result);
    // The next index for a thread; nothing at the end.
    std::optional<size_t> Take();
    void Deliver(BatchResult&& result);
    bool IsOver() const { return cancelled_ || next_to_hand_out_ >= batch_.inputs_.size(); }
    void HandedOut() { batch_.handed_out_ = ++next_to_hand_out_; }
    std::optional<BatchResult>& NextSlot() { return waiting_[next_to_hand_out_ % waiting_.size()]; }

    BatchAnalyzer& batch_;
    const int64_t process_;

    std::mutex mutex_;
    std::condition_variable may_take_;
    std::condition_variable may_hand_out_;
    size_t next_to_take_;      // the first input that no thread has
    size_t next_to_hand_out_;  // the first result that the reader lacks
    size_t waiting_bytes_ = 0;
    std::vector<std::optional<BatchResult>> waiting_;  // a ring, by index
    std::atomic<bool> cancelled_;
    std::atomic<bool> dismissed_{false};
    bool started_;
    bool reader_works_;

    std::mutex join_mutex_;
    std::vector<std::thread> threads_;
    std::mutex reader_worker_mutex_;
    std::unique_ptr<FileWorker> reader_worker_;
  };

  // The ring of this process. A fork copies a ring without its threads, and with locks that they may hold
  // for ever: the copy is left as it is, for good, and the child goes on with a ring of its own.
  Ring& TheRing();
  Wait NextOf(Ring& ring, BatchResult& result, std::chrono::milliseconds patience);

  const Options options_;
  const std::vector<BatchInput> inputs_;
  std::atomic<size_t> handed_out_{0};
  std::atomic<bool> was_cancelled_{false};
  std::atomic<Ring*> ring_;
  std::vector<Ring*> dismissed_;  // those before it
};

}  // namespace quillet
