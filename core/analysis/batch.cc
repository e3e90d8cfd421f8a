// A ring of results between the threads and the reader. A thread waits where its file is too far
// ahead of the reader, and where much is waiting already, except for the very file that the reader
// wants next: so the ring always moves.
#include "analysis/batch.h"

#include <algorithm>
#include <chrono>
#include <exception>
#include <new>
#include <system_error>
#include <utility>

#include "analysis/source_bytes.h"
#include "foundations/console.h"

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

Console CollectingConsole() {
  return {
      [](Text line) { reports_of_thread.Add(std::string(line)); },
      [](const std::exception_ptr& exception, bool) { reports_of_thread.Add(MessageOf(exception)); },
      DescribeException,
  };
}

// ---- one thread's work on one file ----

class Worker {
 public:
  Worker(const BatchAnalyzer::Options& options, const std::atomic<bool>& cancelled)
      : options_(options), cancelled_(cancelled), file_(options.analyzer) {
    if (options.make_writer) writer_ = options.make_writer();
  }

  BatchResult Analyze(const BatchInput& input, size_t index) {
    BatchResult result;
    result.index = index;
    try {
      result.problem = AnalyzeInto(input, result);
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
      if (std::string problem = ReadSourceFile(input.path, bytes_, cancelled_); !problem.empty()) return problem;
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
    file_.Analyze(bytes);
    Describe(result);
    scopes_.Build(file_);
    if (writer_ != nullptr)
      writer_->Write(input, file_, scopes_, placed_, result.output);
    else
      result.table = tables_.Make(file_, scopes_, placed_);
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
      const SyntaxError& error = file_.errors()[static_cast<size_t>(index)];
      const Position position = file_.ErrorPosition(i);
      result.errors.push_back(
          {static_cast<uint32_t>(position.line) + 1, static_cast<uint32_t>(position.col) + 1, error.message()});
    }
  }

  const BatchAnalyzer::Options& options_;
  const std::atomic<bool>& cancelled_;
  FileAnalyzer file_;
  ScopeNames scopes_;
  PlacedRecords placed_;
  RecordTableMaker tables_;
  std::unique_ptr<FileWriter> writer_;
  std::string bytes_;
};

}  // namespace

size_t BatchResult::ByteSize() const { return sizeof(BatchResult) + table.ByteSize() + output.capacity(); }

// ---- the ring ----

BatchAnalyzer::BatchAnalyzer(Options options, std::vector<BatchInput> inputs)
    : options_(std::move(options)), inputs_(std::move(inputs)) {
  waiting_.resize(std::max<size_t>(options_.most_waiting, 1));
}

BatchAnalyzer::~BatchAnalyzer() { Cancel(); }

void BatchAnalyzer::Start() {
  const std::lock_guard lock(mutex_);
  if (!started_) StartThreads();
}

void BatchAnalyzer::StartThreads() {
  started_ = true;
  const unsigned cores = std::max(std::thread::hardware_concurrency(), 1u);
  const size_t count = std::min<size_t>(options_.jobs == 0 ? cores : options_.jobs, inputs_.size());
  for (size_t i = 0; i < count; ++i) {
    try {
      threads_.emplace_back([this] { Work(); });
    } catch (const std::system_error&) {
      // Fewer threads than asked for do the same work; none cannot.
      if (threads_.empty()) throw;
      return;
    }
  }
}

void BatchAnalyzer::Work() {
  Console console = CollectingConsole();
  const ThreadConsole own_console(&console);
  std::optional<Worker> worker;
  std::string failure;
  while (const std::optional<size_t> index = Take()) {
    // An analyzer that cannot be built (a grammar file is gone) is told with every file.
    if (!worker) {
      try {
        worker.emplace(options_, cancelled_);
      } catch (...) {
        failure = MessageOf(std::current_exception());
      }
    }
    BatchResult result;
    if (worker) {
      result = worker->Analyze(inputs_[*index], *index);
    } else {
      result.index = *index;
      result.problem = failure;
    }
    Deliver(std::move(result));
  }
}

std::optional<size_t> BatchAnalyzer::Take() {
  std::unique_lock lock(mutex_);
  may_take_.wait(lock, [this] {
    if (cancelled_ || next_to_take_ >= inputs_.size()) return true;
    if (next_to_take_ == next_to_hand_out_) return true;
    return next_to_take_ - next_to_hand_out_ < waiting_.size() && waiting_bytes_ < options_.most_waiting_bytes;
  });
  if (cancelled_ || next_to_take_ >= inputs_.size()) return std::nullopt;
  return next_to_take_++;
}

void BatchAnalyzer::Deliver(BatchResult&& result) {
  const size_t index = result.index;
  {
    const std::lock_guard lock(mutex_);
    waiting_bytes_ += result.ByteSize();
    waiting_[index % waiting_.size()] = std::move(result);
    if (index != next_to_hand_out_) return;
  }
  may_hand_out_.notify_one();
}

BatchAnalyzer::Wait BatchAnalyzer::Next(BatchResult& result, std::chrono::milliseconds patience) {
  {
    std::unique_lock lock(mutex_);
    if (!started_) StartThreads();
    const auto is_over = [this] { return cancelled_ || next_to_hand_out_ >= inputs_.size(); };
    std::optional<BatchResult>& slot = waiting_[next_to_hand_out_ % waiting_.size()];
    if (!may_hand_out_.wait_for(lock, patience, [&] { return slot.has_value() || is_over(); })) return Wait::kTimeout;
    if (is_over()) return Wait::kEnd;
    result = std::move(*slot);
    slot.reset();
    waiting_bytes_ -= std::min(waiting_bytes_, result.ByteSize());
    ++next_to_hand_out_;
  }
  may_take_.notify_all();
  return Wait::kResult;
}

bool BatchAnalyzer::Next(BatchResult& result) {
  while (true) {
    const Wait wait = Next(result, std::chrono::hours(1));
    if (wait != Wait::kTimeout) return wait == Wait::kResult;
  }
}

void BatchAnalyzer::Cancel() {
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
