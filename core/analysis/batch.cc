// A ring of results between the threads and the reader. A thread waits where its file is too far
// ahead of the reader, and where much is waiting already, except for the very file that the reader
// wants next: so the ring always moves.
#include "analysis/batch.h"

#include <algorithm>
#include <chrono>
#include <exception>
#include <utility>

#include "foundations/stop.h"

#ifdef _WIN32
#include <process.h>
#else
#include <unistd.h>
#endif

namespace quillet {

namespace {

int64_t ThisProcess() {
#ifdef _WIN32
  return _getpid();
#else
  return getpid();
#endif
}

}  // namespace

// ---- the batch ----

BatchAnalyzer::BatchAnalyzer(Options options, std::vector<BatchInput> inputs)
    : options_(std::move(options)), inputs_(std::move(inputs)), ring_(new Ring(*this, false)) {}

BatchAnalyzer::~BatchAnalyzer() {
  dismissed_.push_back(ring_);
  for (const Ring* ring : dismissed_)
    if (ring->IsOfThisProcess()) delete ring;
}

BatchAnalyzer::Ring& BatchAnalyzer::TheRing() {
  Ring* ring = ring_;
  if (ring->IsOfThisProcess()) [[likely]]
    return *ring;
  auto own = std::make_unique<Ring>(*this, false);
  if (ring_.compare_exchange_strong(ring, own.get())) return *own.release();
  return *ring;  // another thread was first
}

BatchAnalyzer::Wait BatchAnalyzer::Next(BatchResult& result, std::chrono::milliseconds patience) {
  while (true) {
    Ring& ring = TheRing();
    const Wait wait = ring.Next(result, patience);
    if (wait != Wait::kEnd || !ring.is_dismissed()) return wait;
    ring_.wait(&ring);
  }
}

bool BatchAnalyzer::Next(BatchResult& result) {
  while (true) {
    const Wait wait = Next(result, std::chrono::hours(1));
    if (wait != Wait::kTimeout) return wait == Wait::kResult;
  }
}

void BatchAnalyzer::Cancel() {
  was_cancelled_ = true;
  TheRing().Cancel();
}

void BatchAnalyzer::DismissThreads() {
  Ring& ring = TheRing();
  ring.Dismiss();
  // The old one stays as long as this does: readers may still be on their way out of it.
  dismissed_.push_back(&ring);
  ring_ = new Ring(*this, true);
  ring_.notify_all();
}

// ---- the ring ----

BatchAnalyzer::Ring::Ring(BatchAnalyzer& batch, bool reader_works)
    : batch_(batch),
      process_(ThisProcess()),
      next_to_take_(batch.handed_out_),
      next_to_hand_out_(batch.handed_out_),
      waiting_(std::max<size_t>(batch.options_.most_waiting, 1)),
      cancelled_(batch.was_cancelled_.load()),
      started_(reader_works),
      reader_works_(reader_works) {}

BatchAnalyzer::Ring::~Ring() { Cancel(); }

bool BatchAnalyzer::Ring::IsOfThisProcess() const { return process_ == ThisProcess(); }

void BatchAnalyzer::Ring::Start() {
  const std::lock_guard lock(mutex_);
  if (!started_) StartThreads();
}

void BatchAnalyzer::Ring::StartThreads() {
  started_ = true;
  const unsigned cores = std::max(std::thread::hardware_concurrency(), 1u);
  const unsigned jobs = batch_.options_.jobs == 0 ? cores : batch_.options_.jobs;
  const size_t count = std::min<size_t>(jobs, batch_.inputs_.size() - next_to_take_);
  for (size_t i = 0; i < count; ++i) {
    try {
      threads_.emplace_back([this] { Work(); });
    } catch (const std::exception&) {  // fewer threads than asked for do the same work
      reader_works_ = threads_.empty();
      return;
    }
  }
}

StopQuestion BatchAnalyzer::Ring::IsWanted() const {
  return [this] {
    if (cancelled_) throw Stopped();
  };
}

void BatchAnalyzer::Ring::Work() {
  const ThreadStopQuestion is_wanted(IsWanted());
  const std::shared_ptr<void> state = batch_.options_.make_thread_state ? batch_.options_.make_thread_state() : nullptr;
  std::unique_ptr<FileWorker> worker;
  try {
    while (const std::optional<size_t> index = Take())
      Deliver(FileWorker::AnalyzeBy(worker, batch_.options_, batch_.inputs_[*index], *index));
  } catch (const Stopped&) {  // the batch was cancelled
  }
}

std::optional<size_t> BatchAnalyzer::Ring::Take() {
  std::unique_lock lock(mutex_);
  may_take_.wait(lock, [this] {
    if (cancelled_ || next_to_take_ >= batch_.inputs_.size()) return true;
    if (next_to_take_ == next_to_hand_out_) return true;
    return next_to_take_ - next_to_hand_out_ < waiting_.size() && waiting_bytes_ < batch_.options_.most_waiting_bytes;
  });
  if (cancelled_ || next_to_take_ >= batch_.inputs_.size()) return std::nullopt;
  return next_to_take_++;
}

void BatchAnalyzer::Ring::Deliver(BatchResult&& result) {
  const size_t index = result.index;
  {
    const std::lock_guard lock(mutex_);
    waiting_bytes_ += result.ByteSize();
    waiting_[index % waiting_.size()] = std::move(result);
    if (index != next_to_hand_out_) return;
  }
  may_hand_out_.notify_one();
}

BatchAnalyzer::Wait BatchAnalyzer::Ring::Next(BatchResult& result, std::chrono::milliseconds patience) {
  bool wakes_another_reader;
  {
    std::unique_lock lock(mutex_);
    if (!started_) StartThreads();
    if (reader_works_) {
      lock.unlock();
      return NextByReader(result);
    }
    if (!may_hand_out_.wait_for(lock, patience, [this] { return IsOver() || NextSlot().has_value(); }))
      return Wait::kTimeout;
    if (IsOver()) return Wait::kEnd;
    result = std::move(*NextSlot());
    NextSlot().reset();
    waiting_bytes_ -= std::min(waiting_bytes_, result.ByteSize());
    HandedOut();
    wakes_another_reader = IsOver() || NextSlot().has_value();
  }
  may_take_.notify_all();
  if (wakes_another_reader) may_hand_out_.notify_all();
  return Wait::kResult;
}

BatchAnalyzer::Wait BatchAnalyzer::Ring::NextByReader(BatchResult& result) {
  const std::lock_guard one_at_a_time(reader_worker_mutex_);
  if (IsOver()) return Wait::kEnd;
  const ThreadStopQuestion is_wanted(IsWanted());
  try {
    result =
        FileWorker::AnalyzeBy(reader_worker_, batch_.options_, batch_.inputs_[next_to_hand_out_], next_to_hand_out_);
  } catch (const Stopped&) {
    if (cancelled_) return Wait::kEnd;
    throw;
  }
  HandedOut();
  return Wait::kResult;
}

void BatchAnalyzer::Ring::Dismiss() {
  dismissed_ = true;
  Cancel();
}

void BatchAnalyzer::Ring::Cancel() {
  {
    const std::lock_guard lock(mutex_);
    started_ = true;
    cancelled_ = true;
  }
  may_take_.notify_all();
  may_hand_out_.notify_all();
  const std::lock_guard lock(join_mutex_);
  for (std::thread& thread : threads_) {
    if (thread.joinable()) thread.join();
  }
}

}  // namespace quillet
