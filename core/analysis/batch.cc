// A ring of results between the threads and the reader. A thread waits where its file is too far
// ahead of the reader, and where much is waiting already, except for the very file that the reader
// wants next: so the ring always moves.
#include "analysis/batch.h"

#include <algorithm>
#include <chrono>
#include <exception>
#include <new>
#include <utility>

#include "analysis/source_bytes.h"
#include "foundations/console.h"
#include "foundations/stop.h"

#ifdef _WIN32
#include <process.h>
#else
#include <unistd.h>
#endif

namespace quillet {

namespace {

// ---- what the core says of itself while a thread works on a file ----

struct Reports {
  const FileAnalyzer* file = nullptr;
  std::vector<BatchResult::Message>* messages = nullptr;

  void Add(std::string text) {
    // The line under way is the one that has no result yet.
    const size_t row = file->results().size();
    const uint32_t line = row < file->rows().size() ? file->rows()[row].first_line + 1 : 1;
    messages->push_back({line, 1, std::move(text)});
  }
};

thread_local Reports reports_of_thread;

std::string MessageOf(const std::exception_ptr& exception) {
  try {
    std::rethrow_exception(exception);
  } catch (const Error& error) {
    return error.message();
  } catch (const std::bad_alloc&) {
    return "out of memory";
  } catch (const std::exception& error) {
    return error.what();
  } catch (...) {
    return "unknown failure";
  }
}

std::string DescribeException(const std::exception_ptr& exception) { return MessageOf(exception); }

// A walk that ended at a limit prints a line for those who know the walkers; here it is said to all others.
// It is empty for what only those want to know: that a tree was too deep to be given back node by node.
std::string InWords(Text line) {
  if (line == "depth too great") return {};
  if (!line.starts_with("RuntimeError raised in ")) return std::string(line);
  const bool is_deep = line.find("recurs") != Text::npos;
  return std::string(is_deep ? "too deeply nested" : "too long") + " to be read whole; its records may be incomplete";
}

Console CollectingConsole() {
  return {
      [](Text line) {
        if (std::string words = InWords(line); !words.empty()) reports_of_thread.Add(std::move(words));
      },
      [](const std::exception_ptr& exception, bool) {
        reports_of_thread.Add("could not be read whole, by an internal error: " + MessageOf(exception));
      },
      DescribeException,
  };
}

int64_t ThisProcess() {
#ifdef _WIN32
  return _getpid();
#else
  return getpid();
#endif
}

}  // namespace

// ---- one thread's work on one file ----

class BatchAnalyzer::Worker {
 public:
  explicit Worker(const BatchAnalyzer::Options& options) : options_(options), file_(options.analyzer) {
    if (options.make_writer) writer_ = options.make_writer();
    if (options.make_binder) binder_ = options.make_binder();
  }

  BatchResult Analyze(const BatchInput& input, size_t index) {
    BatchResult result;
    result.index = index;
    try {
      result.problem = AnalyzeInto(input, result);
    } catch (const Stopped&) {
      throw;
    } catch (...) {
      result = {};
      result.index = index;
      result.problem = MessageOf(std::current_exception());
    }
    return result;
  }

 private:
  // Why it could not be analysed, or nothing.
  std::string AnalyzeInto(const BatchInput& input, BatchResult& result) {
    if (!input.problem.empty()) return input.problem;
    Text bytes;
    if (input.bytes) {
      bytes = *input.bytes;
    } else {
      if (std::string problem = ReadSourceFile(input.path, bytes_); !problem.empty()) return problem;
      bytes = bytes_;
    }
    result.byte_count = bytes.size();
    std::string utf8;
    if (NeedsHostDecoding(bytes)) {
      if (!options_.decode) return "the source names an encoding that only a host can decode";
      if (!options_.decode(bytes, utf8)) return utf8;
      bytes = utf8;
    }
    if (bytes.size() > SourceText::kMaxSize) return "the source is too large";

    reports_of_thread = {&file_, &result.reports};
    file_.Analyze(bytes, writer_ != nullptr ? writer_->row_filter() : nullptr);
    Describe(result);
    scopes_.Build(file_);
    if (writer_ != nullptr)
      writer_->Write(input, file_, scopes_, placed_, result.output);
    else
      result.table = tables_.Make(file_, scopes_, placed_);
    if (binder_ != nullptr) binder_->Bind(file_, result);
    return {};
  }

  void Describe(BatchResult& result) const {
    result.line_count = file_.LineCount();
    for (const LineRow& row : file_.rows())
      result.statement_count += row.kind != LineKind::kBlankLine && row.kind != LineKind::kComment;
    result.errors.reserve(file_.errors().size());
    for (size_t i = 0; i < file_.rows().size() && result.errors.size() < file_.errors().size(); ++i) {
      const int32_t index = file_.results()[i].error;
      if (index < 0) continue;
      const FileAnalyzer::Failure& error = file_.errors()[static_cast<size_t>(index)];
      const Position position = file_.ErrorPosition(i);
      result.errors.push_back(
          {static_cast<uint32_t>(position.line) + 1, static_cast<uint32_t>(position.col) + 1, error.message()});
    }
  }

  const BatchAnalyzer::Options& options_;
  FileAnalyzer file_;
  ScopeNames scopes_;
  PlacedRecords placed_;
  RecordTableMaker tables_;
  std::unique_ptr<FileWriter> writer_;
  std::unique_ptr<FileBinder> binder_;
  std::string bytes_;
};

size_t BatchResult::ByteSize() const {
  return sizeof(BatchResult) + table.ByteSize() + output.capacity() + bindings_size;
}

// ---- the batch ----

BatchAnalyzer::BatchAnalyzer(Options options, std::vector<BatchInput> inputs)
    : options_(std::move(options)), inputs_(std::move(inputs)), ring_(new Ring(*this, false)) {}

BatchAnalyzer::~BatchAnalyzer() {
  Ring* const ring = ring_;
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
  // The old one stays: readers may still be on their way out of it.
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
  std::unique_ptr<Worker> worker;
  try {
    while (const std::optional<size_t> index = Take()) Deliver(Analyze(worker, *index));
  } catch (const Stopped&) {  // the batch was cancelled
  }
}

BatchResult BatchAnalyzer::Ring::Analyze(std::unique_ptr<Worker>& worker, size_t index) {
  Console console = CollectingConsole();
  const ThreadConsole own_console(&console);
  // An analyzer that cannot be built (a grammar file is gone) is told with every file.
  try {
    if (worker == nullptr) worker = std::make_unique<Worker>(batch_.options_);
  } catch (...) {
    BatchResult result;
    result.index = index;
    result.problem = MessageOf(std::current_exception());
    return result;
  }
  return worker->Analyze(batch_.inputs_[index], index);
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
    result = Analyze(reader_worker_, next_to_hand_out_);
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
