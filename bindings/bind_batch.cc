// Many files through the native path, without the interpreter lock and without an object a line.
//
// _host.NativeBatch takes sources in memory and counts their records; _host.Batch takes paths and hands
// out a result a file, whose records are columns of the core until Python asks for some of them.
// The trap: threads of a batch may wait for the interpreter lock (to decode a source), so nothing that
// waits for them may hold it.
#include <nanobind/stl/string.h>
#include <nanobind/stl/unique_ptr.h>
#include <nanobind/stl/vector.h>

#include <chrono>
#include <memory>
#include <utility>
#include <vector>

#include "analysis/batch.h"
#include "analysis/file_analyzer.h"
#include "bindings/batch_format.h"
#include "bindings/bindings.h"
#include "bindings/convert.h"
#include "bindings/names_object.h"
#include "bindings/rows.h"
#include "bindings/site_object.h"
#include "names/batch_binder.h"
#include "output/arrow_stream.h"
#include "output/json_lines.h"
#include "output/text_lines.h"

namespace quillet::host {
namespace {

// What an analyzer is built from. Grammar files are absolute paths.
struct Language {
  FileAnalyzer::Options options;

  Language(nb::handle version_triple, std::string grammar_file, std::string hint_grammar_file,
           std::vector<std::string> keywords, bool py3_grammar, std::string print_function_grammar_file) {
    options.version = VersionOf(version_triple);
    options.grammar_file = std::move(grammar_file);
    options.hint_grammar_file = std::move(hint_grammar_file);
    options.hint_keywords = keywords;
    options.keywords = std::move(keywords);
    options.py3_grammar = py3_grammar;
    options.print_function_grammar_file = std::move(print_function_grammar_file);
  }
};

class NativeBatch {
 public:
  explicit NativeBatch(const Language& language) : files_(language.options) {}

  // The number of records and of statements rejected, over all sources.
  std::pair<size_t, size_t> Analyze(nb::handle sources) {
    const nb::object tuple = TupleOf(sources);
    std::vector<HostText> texts;
    for (nb::handle source : nb::cast<nb::tuple>(tuple)) texts.push_back(HostText::FromBytes(source));
    size_t records = 0;
    size_t rejected = 0;
    nb::gil_scoped_release unlocked;
    for (const HostText& text : texts) {
      files_.Analyze(text.text());
      records += files_.store().rows.size() + files_.store().arg_rows.size();
      rejected += files_.errors().size();
    }
    return {records, rejected};
  }

 private:
  FileAnalyzer files_;
};

// ---- files ----

// The numbers that a database gave to the texts of a list: a list of int, one a text.
class TextNumbers {
 public:
  TextNumbers(nb::handle list, const TextList& texts) : list_(list) {
    if (!PyList_Check(list.ptr()) || nb::len(list) != texts.size())
      ThrowError(ErrorKind::kValueError, "a list with a number a text is needed");
  }
  nb::object operator[](size_t i) const { return nb::borrow(PyList_GET_ITEM(list_.ptr(), static_cast<Py_ssize_t>(i))); }

 private:
  nb::handle list_;
};

struct FileResult {
  BatchResult result;
  ShownTexts scopes{result.table.scope_texts};
  ShownTexts names{result.table.name_texts};
  ShownTexts details{result.table.detail_texts};

  FileResult() = default;
  FileResult(const FileResult&) = delete;
  FileResult& operator=(const FileResult&) = delete;

  nb::list Messages(const std::vector<BatchResult::Message>& messages) const {
    nb::list list;
    for (const BatchResult::Message& message : messages)
      list.append(nb::make_tuple(message.line, message.column, Checked(ShownText(message.text))));
    return list;
  }

  // None for a result of a batch that does not bind, and for a file with a problem.
  std::unique_ptr<FileNames> Names() const {
    return result.bindings ? std::make_unique<FileNames>(result.bindings) : nullptr;
  }

  nb::list Definitions(nb::handle row_class) {
    nb::list list;
    for (const RecordTable::Definition& definition : result.table.definitions) {
      list.append(row_class(scopes[definition.scope], WordOf(definition.kind), definition.line, definition.column,
                            definition.first_line, definition.last_line));
    }
    return list;
  }

  static const char* WordOf(ScopeNames::ScopeKind kind) {
    switch (kind) {
      case ScopeNames::ScopeKind::kModule:
        return "module";
      case ScopeNames::ScopeKind::kClass:
        return "class";
      case ScopeNames::ScopeKind::kFunction:
        return "def";
      case ScopeNames::ScopeKind::kTypeAlias:
        return "type";
    }
    return "";
  }

  // Records as instances of a class that derives from tuple, with the host's own objects for kinds.
  nb::list Rows(size_t begin, size_t end, nb::handle row_class, const nb::tuple& kinds) {
    const RecordTable& table = result.table;
    CheckRowClass(row_class);
    if (kinds.size() != RecordKindWords().size()) ThrowError(ErrorKind::kValueError, "an object a kind is needed");
    end = std::min(end, table.size());
    begin = std::min(begin, end);
    nb::list rows;
    for (size_t i = begin; i < end; ++i) {
      TupleFiller row(row_class, 7);
      row.Add(table.lines[i]);
      row.Add(table.columns[i]);
      row.Add(scopes[table.scopes[i]]);
      row.Add(names[table.names[i]]);
      row.Add(nb::borrow(kinds[static_cast<size_t>(table.kinds[i])]));
      row.Add(details[table.details[i]]);
      row.Add(nb::borrow(table.is_parameter[i] ? Py_True : Py_False));
      rows.append(row.Take());
    }
    return rows;
  }

  // Records as rows of integers for a database that holds texts by numbers, `rows_per_tuple` in each
  // tuple: what is left behind the last full one is in nobody's. A row has kDatabaseColumns, which are
  // id, name, scope, line, column, kind, is_parameter, opens, detail; record i has the id first_id + i.
  nb::list NumberedRows(size_t begin, size_t end, size_t rows_per_tuple, size_t first_id, nb::handle name_numbers,
                        nb::handle scope_numbers, nb::handle detail_numbers) const {
    constexpr size_t kDatabaseColumns = 9;
    const RecordTable& table = result.table;
    const TextNumbers name_number(name_numbers, table.name_texts);
    const TextNumbers scope_number(scope_numbers, table.scope_texts);
    const TextNumbers detail_number(detail_numbers, table.detail_texts);
    if (rows_per_tuple == 0 || rows_per_tuple > 1024)
      ThrowError(ErrorKind::kValueError, "a tuple holds from 1 to 1024 rows");
    end = std::min(end, table.size());
    nb::list tuples;
    for (size_t i = begin; i < end && end - i >= rows_per_tuple;) {
      TupleFiller tuple(&PyTuple_Type, static_cast<Py_ssize_t>(rows_per_tuple * kDatabaseColumns));
      for (const size_t behind = i + rows_per_tuple; i < behind; ++i) {
        tuple.Add(first_id + i);
        tuple.Add(name_number[table.names[i]]);
        tuple.Add(scope_number[table.scopes[i]]);
        tuple.Add(table.lines[i]);
        tuple.Add(table.columns[i]);
        tuple.Add(static_cast<size_t>(table.kinds[i]));
        tuple.Add(size_t{table.is_parameter[i]});
        tuple.Add(static_cast<size_t>(table.opens[i]));
        tuple.Add(detail_number[table.details[i]]);
      }
      tuples.append(tuple.Take());
    }
    return tuples;
  }
};

// The buffer of a result is its output: what a format wrote, without a copy.
int OutputBuffer(PyObject* self, Py_buffer* view, int flags) {
  std::string& output = nb::inst_ptr<FileResult>(self)->result.output;
  return PyBuffer_FillInfo(view, self, output.data(), static_cast<Py_ssize_t>(output.size()), 1, flags);
}

PyType_Slot file_result_slots[] = {{Py_bf_getbuffer, reinterpret_cast<void*>(OutputBuffer)}, {0, nullptr}};

// Without the interpreter lock while this lives, whether the thread has it or not.
class Unlocked {
 public:
  Unlocked() : state_(PyGILState_Check() ? PyEval_SaveThread() : nullptr) {}
  ~Unlocked() {
    if (state_ != nullptr) PyEval_RestoreThread(state_);
  }
  Unlocked(const Unlocked&) = delete;
  Unlocked& operator=(const Unlocked&) = delete;

 private:
  PyThreadState* state_;
};

// Inputs are tuples (path, source or None, problem or None), all bytes.
std::vector<BatchInput> InputsOf(nb::handle sequence) {
  std::vector<BatchInput> inputs;
  for (nb::handle item : TupleOf(sequence)) {
    const auto tuple = nb::cast<nb::tuple>(item);
    BatchInput& input = inputs.emplace_back();
    input.path = HostText::FromBytes(tuple[0]).text();
    if (!nb::handle(tuple[1]).is_none()) input.bytes = HostText::FromBytes(tuple[1]).text();
    if (!nb::handle(tuple[2]).is_none()) input.problem = HostText::FromBytes(tuple[2]).text();
  }
  return inputs;
}

class FileBatch {
 public:
  FileBatch(const Language& language, nb::handle inputs, unsigned jobs, nb::object decode, nb::object format,
            bool bindings)
      : decode_(std::move(decode)),
        format_(std::move(format)),
        batch_(std::make_unique<BatchAnalyzer>(OptionsOf(language, jobs, bindings), InputsOf(inputs))) {}
  ~FileBatch() { Cancel(); }
  FileBatch(const FileBatch&) = delete;
  FileBatch& operator=(const FileBatch&) = delete;

  void Start() { batch_->Start(); }

  // Python's own signals end the wait by their exceptions.
  nb::object Next() {
    auto next = std::make_unique<FileResult>();
    if (!NextResult(next->result)) return nb::none();
    return nb::cast(next.release(), nb::rv_policy::take_ownership);
  }

  // The same for native readers, which may call with or without the lock; false at the end.
  bool NextResult(BatchResult& result) {
    constexpr std::chrono::milliseconds kPatience(100);
    while (true) {
      BatchAnalyzer::Wait wait;
      {
        const Unlocked unlocked;
        const std::lock_guard one_reader(reader_mutex_);
        wait = batch_->Next(result, kPatience);
        if (wait == BatchAnalyzer::Wait::kResult && !result.problem.empty())
          problems_.emplace_back(result.index, result.problem);
      }
      if (wait != BatchAnalyzer::Wait::kTimeout) return wait == BatchAnalyzer::Wait::kResult;
      nb::gil_scoped_acquire lock;
      if (PyErr_CheckSignals() != 0) throw nb::python_error();
    }
  }

  const std::vector<BatchInput>& inputs() const { return batch_->inputs(); }

  // The files so far that could not be analysed, as (index, reason).
  nb::list Problems() {
    std::vector<std::pair<size_t, std::string>> problems;
    {
      const Unlocked unlocked;
      const std::lock_guard one_reader(reader_mutex_);
      problems = problems_;
    }
    nb::list list;
    for (const auto& [index, problem] : problems) list.append(nb::make_tuple(index, StrOf(problem)));
    return list;
  }

  void Cancel() {
    nb::gil_scoped_release unlocked;
    batch_->Cancel();
  }

 private:
  BatchAnalyzer::Options OptionsOf(const Language& language, unsigned jobs, bool bindings) const {
    BatchAnalyzer::Options options;
    options.analyzer = language.options;
    options.jobs = jobs;
    if (bindings) options.make_binder = [version = language.options.version] { return MakeFileBinder(version); };
    // The host's function gives (UTF-8, None) or (None, reason). It lives as long as this, and so
    // longer than the threads.
    PyObject* const decode = decode_.ptr();
    options.decode = [decode](Text bytes, std::string& utf8) {
      nb::gil_scoped_acquire lock;
      try {
        const auto answer = nb::cast<nb::tuple>(nb::handle(decode)(BytesOf(bytes)));
        const bool done = nb::handle(answer[1]).is_none();
        utf8 = done ? HostText::FromBytes(answer[0]).text() : HostText::FromStr(answer[1]).text();
        return done;
      } catch (const std::exception& error) {
        utf8 = error.what();
        return false;
      }
    };
    options.make_writer = WriterMaker(options.analyzer.version);
    return options;
  }

  // The format is None, one that another subsystem made, ("jsonl", errors_only), ("text", errors_only, colours,
  // width of a character), ("site survey",) or ("site page", site index).
  std::function<std::unique_ptr<FileWriter>()> WriterMaker(Version version) const {
    if (format_.is_none()) return {};
    if (nb::isinstance<BatchFormat>(format_))
      return [make = nb::cast<const BatchFormat&>(format_).make, version] { return make(version); };
    const auto format = nb::cast<nb::tuple>(format_);
    if (nb::cast<std::string>(format[0]) == "site survey") return [version] { return MakeSiteSurveyWriter(version); };
    if (nb::cast<std::string>(format[0]) == "site page") {
      auto& site = nb::cast<SiteObject&>(format[1]);
      site.is_shared = true;
      return [index = std::shared_ptr<const SiteIndex>(site.index), version] {
        return MakeSitePageWriter(index, version);
      };
    }
    const bool errors_only = nb::cast<bool>(format[1]);
    if (nb::cast<std::string>(format[0]) == "jsonl") {
      const JsonLinesOptions options{errors_only};
      return [options] { return MakeJsonLinesWriter(options); };
    }
    TextLinesOptions options{errors_only, nb::cast<bool>(format[2]), {}};
    PyObject* const width_of = nb::handle(format[3]).ptr();
    options.width_of = [width_of](uint32_t code_point) {
      nb::gil_scoped_acquire lock;
      return nb::cast<uint32_t>(nb::handle(width_of)(code_point));
    };
    return [options] { return MakeTextLinesWriter(options); };
  }

  nb::object decode_;
  nb::object format_;
  std::mutex reader_mutex_;
  std::vector<std::pair<size_t, std::string>> problems_;
  std::unique_ptr<BatchAnalyzer> batch_;
};

// ---- columns ----

class StreamSource : public RecordSource {
 public:
  explicit StreamSource(nb::object batch) : batch_(std::move(batch)), files_(nb::cast<FileBatch*>(batch_)) {}
  // The stream may be released by a thread without the lock.
  ~StreamSource() override {
    nb::gil_scoped_acquire lock;
    batch_.reset();
  }

  bool Next(BatchResult& result) override {
    try {
      return files_->NextResult(result);
    } catch (nb::python_error& interrupt) {
      nb::gil_scoped_acquire lock;
      const std::string message = interrupt.what();
      interrupt.restore();
      PyErr_Clear();
      ThrowError(ErrorKind::kRuntimeError, message);
    }
  }
  const std::vector<BatchInput>& inputs() const override { return files_->inputs(); }

 private:
  nb::object batch_;
  FileBatch* files_;
};

constexpr const char* kStreamCapsule = "arrow_array_stream";

void ReleaseStreamCapsule(PyObject* capsule) {
  auto* stream = static_cast<ArrowArrayStream*>(PyCapsule_GetPointer(capsule, kStreamCapsule));
  if (stream->release != nullptr) stream->release(stream);
  delete stream;
}

// A capsule as the interface lays it down: a reader that takes the stream leaves it released.
using Export = void (*)(std::unique_ptr<RecordSource>, ArrowArrayStream*);
nb::object StreamCapsule(nb::object batch, Export export_stream) {
  auto stream = std::make_unique<ArrowArrayStream>();
  export_stream(std::make_unique<StreamSource>(std::move(batch)), stream.get());
  nb::object capsule = nb::steal(PyCapsule_New(stream.get(), kStreamCapsule, ReleaseStreamCapsule));
  if (!capsule.is_valid()) {
    stream->release(stream.get());
    throw nb::python_error();
  }
  static_cast<void>(stream.release());
  return capsule;
}

}  // namespace

void BindBatch(nb::module_& tarvex) {
  nb::module_ host = SiblingModule(tarvex, "host");
  nb::class_<Language>(host, "Language", "What an analyzer is built from. Grammar files are absolute paths.")
      .def(nb::init<nb::handle, std::string, std::string, std::vector<std::string>, bool, std::string>(),
           nb::arg("version_triple"), nb::arg("grammar_file"), nb::arg("hint_grammar_file"), nb::arg("keyword_seq"),
           nb::arg("py3_grammar"), nb::arg("print_function_grammar_file"));
  nb::class_<NativeBatch>(host, "NativeBatch",
                          "Sources through the native path, without an object a line. One thread at a time.")
      .def(nb::init<const Language&>(), nb::arg("language"))
      .def(
          "Analyze",
          [](NativeBatch& self, nb::handle sources) {
            const auto [records, rejected] = self.Analyze(sources);
            return nb::make_tuple(records, rejected);
          },
          nb::arg("sources"), "Analyses UTF-8 sources, a sequence of bytes; gives (records, statements rejected).");

  nb::class_<FileResult>(host, "FileResult", nb::type_slots(file_result_slots),
                         "What became of a file of a batch. Its buffer is what a format wrote of it.")
      .def_prop_ro("index", [](const FileResult& self) { return self.result.index; })
      .def_prop_ro("problem",
                   [](const FileResult& self) {
                     return self.result.problem.empty() ? nb::object(nb::none()) : StrOf(self.result.problem);
                   })
      .def_prop_ro("byte_count", [](const FileResult& self) { return self.result.byte_count; })
      .def_prop_ro("line_count", [](const FileResult& self) { return self.result.line_count; })
      .def_prop_ro("statement_count", [](const FileResult& self) { return self.result.statement_count; })
      .def_prop_ro("errors", [](const FileResult& self) { return self.Messages(self.result.errors); })
      .def_prop_ro("reports", [](const FileResult& self) { return self.Messages(self.result.reports); })
      .def_prop_ro("names", &FileResult::Names)
      .def_prop_ro("record_count", [](const FileResult& self) { return self.result.table.size(); })
      .def("Definitions", &FileResult::Definitions, nb::arg("row_class"),
           "Classes, functions and type aliases: row_class(scope, kind, line, column, first_line, last_line).")
      .def("Rows", &FileResult::Rows, nb::arg("begin"), nb::arg("end"), nb::arg("row_class"), nb::arg("kinds"),
           "Records from `begin` up to `end` as instances of a class that derives from tuple.")
      .def_prop_ro("name_texts", [](FileResult& self) { return self.names.All(); })
      .def_prop_ro("scope_texts", [](FileResult& self) { return self.scopes.All(); })
      .def_prop_ro("detail_texts", [](FileResult& self) { return self.details.All(); })
      .def("NumberedRows", &FileResult::NumberedRows, nb::arg("begin"), nb::arg("end"), nb::arg("rows_per_tuple"),
           nb::arg("first_id"), nb::arg("name_numbers"), nb::arg("scope_numbers"), nb::arg("detail_numbers"),
           "Records as rows of integers, several in a tuple, with a database's numbers for the texts: id, name, "
           "scope, line, column, kind, is_parameter, opens, detail.");
  nb::class_<FileBatch>(host, "Batch", "Files through the native path, on threads without the interpreter lock.")
      .def(nb::init<const Language&, nb::handle, unsigned, nb::object, nb::object, bool>(), nb::arg("language"),
           nb::arg("inputs"), nb::arg("jobs"), nb::arg("decode"), nb::arg("format").none(), nb::arg("bindings"))
      .def("Start", &FileBatch::Start, "Sets the threads to work in front of the first Next.")
      .def("Next", &FileBatch::Next, "The next file's result, in the order of the inputs; None at the end.")
      .def_prop_ro("problems", &FileBatch::Problems)
      .def(
          "ArrowStream", [](nb::object self) { return StreamCapsule(std::move(self), ExportRecordStream); },
          "The records that were not handed out yet, as a capsule of the Arrow C stream interface.")
      .def(
          "OccurrenceStream", [](nb::object self) { return StreamCapsule(std::move(self), ExportOccurrenceStream); },
          "The same with the names of files: for a batch that binds.")
      .def("Cancel", &FileBatch::Cancel, "Stops after the files under way.");
}

}  // namespace quillet::host
