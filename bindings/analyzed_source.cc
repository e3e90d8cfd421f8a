// Records and errors of analysed lines as objects of the host's.
#include "bindings/analyzed_source.h"

#include <optional>
#include <string>
#include <utility>

#include "analysis/record_words.h"
#include "bindings/errors.h"
#include "bindings/interpreter_lock.h"
#include "bindings/rows.h"
#include "bindings/signals.h"
#include "lines/future_imports.h"
#include "vocabulary/symbolinfo.h"

namespace quillet::host {
namespace {

// From this size on other threads may run meanwhile: below it, waiting for the lock again costs more.
constexpr size_t kSizeWithoutLock = size_t{1} << 14;

// Kept to the end of the process, whose interpreter may be gone by then.
StrCache& g_strs = *new StrCache;

nb::object ShownName(Text name) {
  if (!name.starts_with(kArgPrefix)) [[likely]]
    return g_strs.Get(name);
  std::string shown;
  AppendArgumentPlace(name, shown);
  return ShownText(shown);
}

}  // namespace

AnalyzedSource::AnalyzedSource(Language& language, Text bytes, nb::handle record_class, const nb::tuple& kinds)
    : record_class_(nb::borrow(record_class)), kinds_(kinds) {
  CheckRowClass(record_class);
  if (kinds.size() != RecordKindWords().size()) ThrowError(ErrorKind::kValueError, "an object a kind is needed");
  const Language::Analyzer files(language);
  {
    std::optional<Unlocked> unlocked;
    if (bytes.size() >= kSizeWithoutLock) unlocked.emplace();
    const ThreadStopQuestion signals(HandlesSignals());
    files->Analyze(bytes);
  }
  found_ = files->TakeFound();
  cut_ = new SharedCut(found_.source);
  cut_->store = std::move(found_.store);
  for (size_t i = 0; i < found_.results.size(); ++i) {
    if (found_.results[i].error >= 0) rows_with_error_.push_back(i);
  }
}

bool AnalyzedSource::has_print_function() const { return ImportsPrintFunction(*found_.source, found_.rows); }

nb::object AnalyzedSource::LogicalOf(size_t i) const {
  const FileAnalyzer::LineResult& of_line = result(i);
  nb::object logical = NewLineObject(cut_, row(i));
  LineOf(logical).SetAnalyzed(of_line.record_begin, of_line.record_end, of_line.arg_record_begin,
                              of_line.arg_record_end);
  return logical;
}

nb::object AnalyzedSource::ErrorOf(size_t i) const {
  if (result(i).error < 0) return nb::none();
  return ExceptionFor(found_.WholeErrorOf(i));
}

nb::object AnalyzedSource::RecordsOf(size_t i) const {
  const FileAnalyzer::LineResult& of_line = result(i);
  TupleFiller records(&PyTuple_Type,
                      of_line.record_end - of_line.record_begin + of_line.arg_record_end - of_line.arg_record_begin);
  std::string buffer;
  const auto add = [&](const Record& record, bool is_parameter) {
    const RecordInWords words = DecodeInfo(record.info(), buffer);
    TupleFiller made(record_class_, 4);
    made.Add(ShownName(record.name()));
    made.Add(nb::borrow(kinds_[static_cast<size_t>(words.kind)]));
    made.Add(g_strs.Get(words.detail));
    made.Add(nb::borrow(is_parameter ? Py_True : Py_False));
    records.Add(made.TakePlain());
  };
  // Copies: the lines of the source share the store, and one that is analysed again prolongs it.
  for (uint32_t at = of_line.record_begin; at < of_line.record_end; ++at) add(Record(cut_->store.rows[at]), false);
  for (uint32_t at = of_line.arg_record_begin; at < of_line.arg_record_end; ++at)
    add(Record(cut_->store.arg_rows[at]), true);
  return records.TakePlain();
}

}  // namespace quillet::host
