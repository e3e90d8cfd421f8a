// Reading, analysing, describing; in front of it a console of its own for what the core says meanwhile.
#include "analysis/file_worker.h"

#include <exception>
#include <new>
#include <utility>

#include "analysis/source_bytes.h"
#include "foundations/console.h"
#include "foundations/errors.h"
#include "foundations/stop.h"

namespace quillet {

namespace {

// ---- what the core says of itself while a thread works on a file ----

struct Reports {
  const FileAnalyzer* file = nullptr;
  std::vector<BatchResult::Message>* messages = nullptr;

  void Add(std::string text) {
    const size_t row = file->row_under_way();
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

BatchResult FailedResult(size_t index) {
  BatchResult result;
  result.index = index;
  result.problem = MessageOf(std::current_exception());
  return result;
}

}  // namespace

FileWorker::FileWorker(const Options& options) : options_(options), file_(options.analyzer) {
  if (options.make_writer) writer_ = options.make_writer();
  if (options.make_binder) binder_ = options.make_binder();
}

BatchResult FileWorker::AnalyzeBy(std::unique_ptr<FileWorker>& worker, const Options& options, const BatchInput& input,
                                  size_t index) {
  Console console = CollectingConsole();
  const ThreadConsole own_console(&console);
  // An analyzer that cannot be built (a grammar file is gone) is told with every file.
  try {
    if (worker == nullptr) worker = std::make_unique<FileWorker>(options);
  } catch (...) {
    return FailedResult(index);
  }
  BatchResult result = worker->Read(input, index);
  if (result.problem.empty()) worker->Write(input, result);
  return result;
}

BatchResult FileWorker::Read(const BatchInput& input, size_t index) {
  Console console = CollectingConsole();
  const ThreadConsole own_console(&console);
  BatchResult result;
  result.index = index;
  try {
    result.problem = ReadInto(input, result);
  } catch (const Stopped&) {
    throw;
  } catch (...) {
    return FailedResult(index);
  }
  return result;
}

void FileWorker::Write(const BatchInput& input, BatchResult& result) {
  Console console = CollectingConsole();
  const ThreadConsole own_console(&console);
  try {
    WriteInto(input, result);
  } catch (const Stopped&) {
    throw;
  } catch (...) {
    result = FailedResult(result.index);
  }
}

std::string FileWorker::ReadInto(const BatchInput& input, BatchResult& result) {
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
  if (!input.is_decoded && NeedsHostDecoding(bytes)) {
    if (!options_.decode) return "the source names an encoding that only a host can decode";
    if (!options_.decode(bytes, utf8)) return utf8;
    bytes = utf8;
  }
  if (bytes.size() > SourceText::kMaxSize) return "the source is too large";

  reports_of_thread = {&file_, &result.reports};
  file_.Analyze(bytes, writer_ != nullptr ? writer_->row_filter() : nullptr);
  Describe(result);
  return {};
}

void FileWorker::WriteInto(const BatchInput& input, BatchResult& result) {
  reports_of_thread = {&file_, &result.reports};
  scopes_.Build(file_);
  if (writer_ != nullptr)
    writer_->Write(input, file_, scopes_, placed_, result.output);
  else
    result.table = tables_.Make(file_, scopes_, placed_);
  if (binder_ != nullptr) binder_->Bind(file_, result);
}

void FileWorker::Describe(BatchResult& result) const {
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

size_t BatchResult::ByteSize() const {
  return sizeof(BatchResult) + table.ByteSize() + output.capacity() + bindings_size;
}

}  // namespace quillet
