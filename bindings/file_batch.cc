// What a batch's threads and its readers do with the host: take its lock, call it, hear of its signals.
#include "bindings/file_batch.h"

#include <algorithm>
#include <chrono>

#include "bindings/batch_format.h"
#include "bindings/convert.h"
#include "bindings/interpreter_lock.h"
#include "bindings/signals.h"
#include "bindings/site_object.h"
#include "names/batch_binder.h"
#include "output/json_lines.h"
#include "output/text_lines.h"

namespace quillet::host {

namespace {

constexpr unsigned kMostJobs = 1024;

// Set at the end of the interpreter.
bool g_without_threads = false;

// All batches, while they live. Changed with the interpreter lock held.
std::vector<FileBatch*>& LiveBatches() {
  static auto& batches = *new std::vector<FileBatch*>;
  return batches;
}

std::vector<BatchInput> InputsOf(nb::handle sequence) {
  std::vector<BatchInput> inputs;
  for (nb::handle item : nb::borrow<nb::tuple>(TupleOf(sequence))) {
    const nb::object parts = TupleOf(item);
    if (nb::len(parts) != 3) ThrowError(ErrorKind::kValueError, "an input is a path, a source and a problem");
    const auto text = [&parts](Py_ssize_t i) { return HostText::FromBytes(PyTuple_GET_ITEM(parts.ptr(), i)); };
    const auto is_there = [&parts](Py_ssize_t i) { return PyTuple_GET_ITEM(parts.ptr(), i) != Py_None; };
    BatchInput& input = inputs.emplace_back();
    input.path = text(0).text();
    if (const nb::handle source = PyTuple_GET_ITEM(parts.ptr(), 1); PyByteArray_Check(source.ptr())) {
      // Text that the host has encoded.
      input.bytes = std::string(PyByteArray_AS_STRING(source.ptr()), static_cast<size_t>(nb::len(source)));
      input.is_decoded = true;
    } else if (is_there(1)) {
      input.bytes = text(1).text();
    }
    if (is_there(2)) input.problem = text(2).text();
  }
  return inputs;
}

}  // namespace

FileBatch::FileBatch(const Language& language, nb::handle inputs, unsigned jobs, nb::object decode, nb::object format,
                     bool bindings)
    : decoder_(std::move(decode)),
      format_(std::move(format)),
      batch_(
          std::make_unique<BatchAnalyzer>(OptionsOf(language, std::min(jobs, kMostJobs), bindings), InputsOf(inputs))) {
  if (g_without_threads) batch_->DismissThreads();
  LiveBatches().push_back(this);
}

FileBatch::~FileBatch() {
  std::erase(LiveBatches(), this);
  Cancel();
}

void FileBatch::DismissAllThreads() {
  g_without_threads = true;
  // Each may go, and take others with it, while its threads end.
  for (const std::vector<FileBatch*> all = LiveBatches(); FileBatch* const batch : all) {
    if (std::find(LiveBatches().begin(), LiveBatches().end(), batch) == LiveBatches().end()) continue;
    const nb::object keeps_it = nb::find(*batch);
    const Unlocked unlocked;
    batch->batch_->DismissThreads();
  }
}

void FileBatch::Cancel() {
  const Unlocked unlocked;
  batch_->Cancel();
}

bool FileBatch::Next(BatchResult& result) {
  constexpr std::chrono::milliseconds kPatience(100);
  while (true) {
    BatchAnalyzer::Wait wait;
    {
      const Unlocked unlocked;
      const ThreadStopQuestion signals(HandlesSignals());
      wait = batch_->Next(result, kPatience);
    }
    if (wait == BatchAnalyzer::Wait::kResult && result.problem.empty()) return true;
    const Locked lock;
    if (wait == BatchAnalyzer::Wait::kResult) problems_.emplace_back(result.index, result.problem);
    decoder_.RaiseFailure();
    if (wait != BatchAnalyzer::Wait::kTimeout) return wait == BatchAnalyzer::Wait::kResult;
    HandleSignals();
  }
}

nb::list FileBatch::Problems() const {
  nb::list list;
  // By index: making a tuple may run code that prolongs them.
  for (size_t i = 0; i < problems_.size(); ++i)
    list.append(nb::make_tuple(problems_[i].first, StrOf(problems_[i].second)));
  return list;
}

BatchAnalyzer::Options FileBatch::OptionsOf(const Language& language, unsigned jobs, bool bindings) {
  BatchAnalyzer::Options options;
  options.analyzer = language.options();
  options.jobs = jobs;
  options.make_thread_state = [] { return std::make_shared<KeptThreadState>(); };
  options.decode = [this](Text bytes, std::string& utf8) { return decoder_.Decode(bytes, utf8); };
  const Version version = options.analyzer.version;
  if (bindings) options.make_binder = [version] { return MakeFileBinder(version); };
  options.make_writer = WriterMaker(version);
  return options;
}

std::function<std::unique_ptr<FileWriter>()> FileBatch::WriterMaker(Version version) {
  if (format_.is_none()) return {};
  if (nb::isinstance<BatchFormat>(format_))
    return [make = nb::cast<const BatchFormat&>(format_).make, version] { return make(version); };
  const nb::object format = TupleOf(format_);
  const auto part = [&format](Py_ssize_t i) -> nb::handle {
    if (i >= PyTuple_GET_SIZE(format.ptr())) ThrowError(ErrorKind::kValueError, "the format lacks a part");
    return PyTuple_GET_ITEM(format.ptr(), i);
  };
  const HostText kind = HostText::FromStr(part(0));
  if (kind.text() == "site survey") return [version] { return MakeSiteSurveyWriter(version); };
  if (kind.text() == "site page") {
    auto& site = nb::cast<SiteObject&>(part(1));
    site.is_shared = true;
    return
        [index = std::shared_ptr<const SiteIndex>(site.index), version] { return MakeSitePageWriter(index, version); };
  }
  const bool errors_only = part(1).is(Py_True);
  if (kind.text() == "jsonl") {
    const JsonLinesOptions options{errors_only};
    return [options] { return MakeJsonLinesWriter(options); };
  }
  if (kind.text() != "text") ThrowError(ErrorKind::kValueError, "no such format");
  TextLinesOptions options{errors_only, part(2).is(Py_True), {}};
  const nb::handle width_of = part(3);
  format_ = format;  // it may have been given as a list
  options.width_of = [this, width_of](uint32_t code_point) {
    const Locked lock;
    try {
      return static_cast<uint32_t>(std::clamp(Int32Of(width_of(code_point)), 0, 2));
    } catch (nb::python_error& error) {
      ThrowError(ErrorKind::kRuntimeError, decoder_.Failed(error));
    }
  };
  return [options] { return MakeTextLinesWriter(options); };
}

}  // namespace quillet::host
