// What the package's host API needs of the core: a whole source, analysed, its lines made when they are read.
#include <nanobind/stl/string.h>
#include <nanobind/stl/vector.h>

#include <memory>
#include <optional>
#include <utility>
#include <vector>

#include "analysis/record_words.h"
#include "bindings/bindings.h"
#include "bindings/convert.h"
#include "bindings/errors.h"
#include "bindings/interpreter_lock.h"
#include "bindings/language_object.h"
#include "bindings/line_object.h"
#include "bindings/rows.h"
#include "bindings/signals.h"
#include "lines/cutter.h"
#include "lines/future_imports.h"
#include "lines/scopes.h"
#include "vocabulary/symbolinfo.h"

namespace quillet::host {
namespace {

// From this size on other threads may run meanwhile: below it, waiting for the lock again costs more.
constexpr size_t kSizeWithoutLock = size_t{1} << 14;

// Kept to the end of the process, whose interpreter may be gone by then.
StrCache& g_strs = *new StrCache;

class AnalyzedSource {
 public:
  AnalyzedSource(Language& language, Text bytes) : store_(std::make_shared<SharedStore>()) {
    const Language::Analyzer files(language);
    {
      std::optional<Unlocked> unlocked;
      if (bytes.size() >= kSizeWithoutLock) unlocked.emplace();
      const ThreadStopQuestion signals(HandlesSignals());
      files->Analyze(bytes);
    }
    found_ = files->TakeFound();
    store_->store = std::move(found_.store);
    for (size_t i = 0; i < found_.results.size(); ++i) {
      if (found_.results[i].error >= 0) rows_with_error_.push_back(i);
    }
  }

  AnalyzedSource(const AnalyzedSource&) = delete;
  AnalyzedSource& operator=(const AnalyzedSource&) = delete;

  size_t size() const { return found_.rows.size(); }
  // Whether the source switches the print function on, which 2.7 parses otherwise.
  bool has_print_function() const { return ImportsPrintFunction(*found_.source, found_.rows); }
  const std::vector<size_t>& rows_with_error() const { return rows_with_error_; }

  nb::object LogicalAt(int64_t index) const {
    const size_t i = CheckedIndex(index);
    const FileAnalyzer::LineResult& result = found_.results[i];
    nb::object logical = NewLineObject(found_.source, found_.rows[i], store_);
    LineOf(logical).SetAnalyzed(result.record_begin, result.record_end, result.arg_record_begin, result.arg_record_end);
    return logical;
  }

  // (first_line, last_line, indent, in_async_def, first_in_def, error), with lines counted from 1.
  nb::object PlaceAt(int64_t index) const {
    const size_t i = CheckedIndex(index);
    const LineRow& row = found_.rows[i];
    const FileAnalyzer::LineResult& result = found_.results[i];
    TupleFiller place(&PyTuple_Type, 6);
    place.Add(size_t{row.first_line} + 1);
    place.Add(size_t{row.last_line} + 1);
    place.Add(size_t{row.indent});
    place.Add(nb::borrow(result.in_async_def ? Py_True : Py_False));
    place.Add(nb::borrow(result.first_in_def ? Py_True : Py_False));
    place.Add(result.error < 0 ? nb::object(nb::none())
                               : ExceptionFor(found_.whole_errors[static_cast<size_t>(result.error)]));
    return place.Take();
  }

  // The records of a line as found: (name, kind, detail, is_parameter), of a class that derives from tuple.
  nb::object RecordsAt(int64_t index, nb::handle row_class, const nb::tuple& kinds) {
    const size_t i = CheckedIndex(index);
    const FileAnalyzer::LineResult& result = found_.results[i];
    if (!row_class.is(row_class_)) {
      CheckRowClass(row_class);
      row_class_ = nb::borrow(row_class);
    }
    if (kinds.size() != RecordKindWords().size()) ThrowError(ErrorKind::kValueError, "an object a kind is needed");
    TupleFiller records(&PyTuple_Type,
                        result.record_end - result.record_begin + result.arg_record_end - result.arg_record_begin);
    std::string buffer;
    const auto add = [&](const Record& record, bool is_parameter) {
      const RecordInWords words = DecodeInfo(record.info(), buffer);
      TupleFiller row(row_class, 4);
      row.Add(ShownName(record.name()));
      row.Add(nb::borrow(kinds[static_cast<size_t>(words.kind)]));
      row.Add(g_strs.Get(words.detail));
      row.Add(nb::borrow(is_parameter ? Py_True : Py_False));
      records.Add(row.TakePlain());
    };
    // Copies: the lines of the source share the store, and one that is analysed again prolongs it.
    for (uint32_t at = result.record_begin; at < result.record_end; ++at) add(Record(store_->store.rows[at]), false);
    for (uint32_t at = result.arg_record_begin; at < result.arg_record_end; ++at)
      add(Record(store_->store.arg_rows[at]), true);
    return records.TakePlain();
  }

 private:
  size_t CheckedIndex(int64_t index) const {
    if (index < 0 || static_cast<size_t>(index) >= size()) ThrowError(ErrorKind::kIndexError, "no such line");
    return static_cast<size_t>(index);
  }

  static nb::object ShownName(Text name) {
    if (!name.starts_with(kArgPrefix)) [[likely]]
      return g_strs.Get(name);
    std::string shown;
    AppendArgumentPlace(name, shown);
    return ShownText(shown);
  }

  FileAnalyzer::Found found_;
  std::shared_ptr<SharedStore> store_;
  std::vector<size_t> rows_with_error_;
  nb::object row_class_;  // that was checked
};

// The lines of a source, not yet analysed, with their places: for hosts that do that themselves.
nb::list CutSource(Any source, Any version_triple) {
  const HostText text = HostText::FromBytes(source);
  const Version version = VersionOf(version_triple);
  const Ref<SourceText> held = SourceText::Copy(text.text());
  const auto store = std::make_shared<SharedStore>();
  std::vector<LineRow> rows;
  CutLines(*held, version, rows);
  nb::list lines;
  ScopeTracker scopes;
  for (const LineRow& row : rows) {
    const LinePlace place = scopes.Next(row);
    lines.append(nb::make_tuple(NewLineObject(held, row, store), row.first_line, row.last_line, row.indent,
                                place.in_async_def, place.first_in_def));
  }
  return lines;
}

void BindLanguage(nb::module_& host) {
  nb::class_<Language>(host, "Language", "What an analyzer is built from. Grammar files are absolute paths.")
      .def(nb::init<nb::handle, std::string, std::string, std::vector<std::string>, bool, std::string, bool>(),
           nb::arg("version_triple"), nb::arg("grammar_file"), nb::arg("hint_grammar_file"), nb::arg("keyword_seq"),
           nb::arg("py3_grammar"), nb::arg("print_function_grammar_file"), nb::arg("exact"));
}

}  // namespace

void BindHost(nb::module_& tarvex) {
  nb::module_ host = SiblingModule(tarvex, "host");
  tarvex.attr("_host") = host;
  InstallInterrupts();
  BindLanguage(host);
  host.def("CutSource", &CutSource, nb::arg("source"), nb::arg("version_triple"),
           "The lines of a UTF-8 source, not yet analysed: (logical, first_line, last_line, indent, in_async_def, "
           "first_in_def), with lines from 0.");
  nb::class_<AnalyzedSource>(host, "AnalyzedSource",
                             "A UTF-8 source: its logical lines, and what each was found to say.")
      .def(
          "__init__",
          [](AnalyzedSource* self, Language& language, Any source) {
            const HostText text = HostText::FromBytes(source);
            new (self) AnalyzedSource(language, text.text());
          },
          nb::arg("language"), nb::arg("source"))
      .def("__len__", &AnalyzedSource::size)
      .def(
          "LogicalAt", [](AnalyzedSource& self, Any index) { return self.LogicalAt(Int64Of(index)); }, nb::arg("index"),
          "A line as a CLogicalLine.")
      .def(
          "PlaceAt", [](AnalyzedSource& self, Any index) { return self.PlaceAt(Int64Of(index)); }, nb::arg("index"),
          "A line's (first_line, last_line, indent, in_async_def, first_in_def, error), with lines from 1.")
      .def(
          "RecordsAt",
          [](AnalyzedSource& self, Any index, nb::handle row_class, const nb::tuple& kinds) {
            return self.RecordsAt(Int64Of(index), row_class, kinds);
          },
          nb::arg("index"), nb::arg("row_class"), nb::arg("kinds"),
          "A line's records: (name, kind, detail, is_parameter), instances of a class that derives from tuple.")
      .def_prop_ro("print_function", &AnalyzedSource::has_print_function)
      .def_prop_ro("rows_with_error", [](AnalyzedSource& self) { return self.rows_with_error(); });
}

}  // namespace quillet::host
