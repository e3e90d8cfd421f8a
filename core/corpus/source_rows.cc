// A source's rows go into tables while it is analysed; where it fails half way, they are taken out again.
#include "corpus/source_rows.h"

#include <algorithm>
#include <utility>

#include "foundations/errors.h"
#include "foundations/shown_text.h"
#include "names/binder.h"

namespace quillet {

namespace {

// Whether the first line names the interpreter of Python 2.
bool NamesPython2(Text bytes) {
  const Text line = bytes.substr(0, bytes.find_first_of("\r\n"));
  return line.starts_with("#!") && line.find("python2") != Text::npos;
}

std::string InWords(Version version) {
  return std::to_string(version.parts[0]) + "." + std::to_string(version.parts[1]);
}

}  // namespace

// Puts records into rows.
class SourceRows::Writer : public FileWriter {
 public:
  explicit Writer(SourceRows& rows) : rows_(rows) {}

  void Write(const BatchInput&, const FileAnalyzer& file, const ScopeNames& scopes, PlacedRecords& placed,
             std::string&) override {
    if (rows_.options_.form != RowForm::kRecords) return;
    placed.Begin(file, scopes);
    placed.Clear();
    held_ = 0;
    for (size_t row = 0; row < file.rows().size(); ++row) {
      placed.AddRow(row);
      const size_t count = placed.records().size() / RowTable::kRowsAtOnce * RowTable::kRowsAtOnce;
      if (count == 0) continue;
      Put(placed.records().first(count), file, scopes);
      placed.DropFirst(count);
    }
    Put(placed.records(), file, scopes);
  }

 private:
  void Put(std::span<const PlacedRecord> records, const FileAnalyzer& file, const ScopeNames& scopes) {
    for (size_t at = 0; at < records.size(); at += RowTable::kRowsAtOnce) {
      const auto part = records.subspan(at, std::min(RowTable::kRowsAtOnce, records.size() - at));
      for (const PlacedRecord& record : part)
        held_ += record.name.size() + record.detail.size() + scopes.names()[record.scope].size() + sizeof(PlacedRecord);
      file.CheckMemory(held_);
      rows_.Room().AddRecords(part, scopes.names());
    }
  }

  SourceRows& rows_;
  size_t held_ = 0;  // by the rows of a source, in bytes
};

// Puts names into rows.
class SourceRows::Binder : public FileBinder {
 public:
  Binder(SourceRows& rows, Version version) : rows_(rows), binder_(version) {}

  void Bind(const FileAnalyzer& file, BatchResult&) override {
    const Bindings& bindings = binder_.Bind(file.source(), file.rows());
    const std::vector<std::string> scope_names = QualifiedNames(bindings);
    for (uint32_t i = 0; i < bindings.occurrences.size(); ++i) rows_.Room().AddOccurrence(bindings, i, scope_names);
  }

 private:
  SourceRows& rows_;
  NameBinder binder_;
};

SourceRows::SourceRows(Options options) : options_(std::move(options)) {
  readings_.resize(options_.versions.size());
  for (size_t i = 0; i < readings_.size(); ++i) {
    Reading& reading = readings_[i];
    const Version version = options_.versions[i].version;
    reading.python = InWords(version);
    reading.options.analyzer = options_.versions[i];
    reading.options.decode = options_.decode;
    reading.options.make_writer = [this] { return std::make_unique<Writer>(*this); };
    if (options_.form == RowForm::kOccurrences)
      reading.options.make_binder = [this, version] { return std::make_unique<Binder>(*this, version); };
  }
}

// ---- batches ----

void SourceRows::Begin(std::unique_ptr<InputBatch> batch) {
  std::vector<InputColumn> columns;
  std::vector<CarriedColumn> carried;
  for (const std::string& name : options_.kept_columns) {
    columns.push_back(batch->ColumnOf(name));
    carried.emplace_back(name, columns.back(), false);
  }
  columns.push_back(batch->ColumnOf(options_.path_column));
  carried.emplace_back("path", columns.back(), true);
  auto content = std::make_unique<InputColumn>(batch->ColumnOf(options_.content_column));
  static_cast<void>(CarriedColumn(options_.content_column, *content, true));
  std::unique_ptr<InputColumn> problem;
  if (!options_.problem_column.empty()) {
    problem = std::make_unique<InputColumn>(batch->ColumnOf(options_.problem_column));
    static_cast<void>(CarriedColumn(options_.problem_column, *problem, true));
  }
  for (size_t i = 0; i < carried_.size(); ++i) {
    if (!carried_[i].has_schema_of(carried[i])) {
      ThrowError(ErrorKind::kTypeError,
                 "column '" + carried[i].schema().name + "' has another type than in the batches before");
    }
  }
  if (carried_.empty()) {
    static_cast<void>(MakeRowTable(options_.form, carried)->Schema());  // refuses names that clash
    carried_ = std::move(carried);
  }
  columns_ = std::move(columns);
  content_ = std::move(content);
  problem_ = std::move(problem);
  batch_ = std::move(batch);
  row_ = 0;
}

std::shared_ptr<const RowTable> SourceRows::Next() {
  while (full_.empty() && batch_ != nullptr && row_ < batch_->size()) {
    AnalyzeRow();
    ++row_;
    if (table_ != nullptr && table_->IsFull()) full_.push_back(std::exchange(table_, nullptr));
  }
  if (full_.empty()) {
    content_.reset();
    problem_.reset();
    columns_.clear();
    batch_.reset();
    return nullptr;
  }
  given_table_ = std::move(full_.front());
  full_.pop_front();
  return options_.numbered_rows != 0 ? given_table_ : std::exchange(given_table_, nullptr);
}

std::shared_ptr<const RowTable> SourceRows::Finish() {
  if (table_ == nullptr || table_->size() == 0) return nullptr;
  return std::exchange(table_, nullptr);
}

std::shared_ptr<const RowTable> SourceRows::TakeFiles() {
  given_files_ = std::exchange(files_, nullptr);
  return options_.numbered_rows != 0 ? given_files_ : std::exchange(given_files_, nullptr);
}

std::shared_ptr<RowTable> SourceRows::NewTable(RowForm form, std::shared_ptr<RowTable>& given) {
  if (given == nullptr || given.use_count() != 1) return MakeRowTable(form, carried_, options_.numbered_rows);
  given->Truncate(0);
  return std::exchange(given, nullptr);
}

// ---- rows ----

RowTable& SourceRows::Room() {
  if (table_ != nullptr && table_->IsFull()) {
    table_->Carry({&columns_, row_});
    full_.push_back(std::exchange(table_, nullptr));
  }
  if (table_ == nullptr) table_ = NewTable(options_.form, given_table_);
  return *table_;
}

void SourceRows::GoBackTo(const Mark& mark) {
  if (full_.size() > mark.full_tables) {
    table_ = full_[mark.full_tables];
    full_.resize(mark.full_tables);
  }
  if (table_ != nullptr) table_->Truncate(mark.rows);
}

void SourceRows::AnalyzeRow() {
  const Mark mark{full_.size(), table_ != nullptr ? table_->size() : 0};
  BatchInput input;
  Reading* reading = &readings_.front();
  BatchResult result;
  try {
    if (problem_ != nullptr && !problem_->IsNull(row_)) {
      AppendShown(problem_->At(row_), input.problem);
    } else if (content_->IsNull(row_)) {
      input.problem = "there is no source";
    } else {
      input.bytes = content_->At(row_);
      input.is_decoded = content_->form() == InputColumn::Form::kText;
    }
    result = Analyze(input, reading);
    if (!result.problem.empty()) GoBackTo(mark);
    AddMessages(result);
    if (options_.form == RowForm::kFiles) Room().AddFile(result, reading->python);
    if (table_ != nullptr) table_->Carry({&columns_, row_});
    if (problem_ != nullptr) {
      if (files_ == nullptr) files_ = NewTable(RowForm::kFiles, given_files_);
      files_->AddFile(result, reading->python);
      files_->Carry({&columns_, row_});
    }
    ++totals_.files;
    totals_.bytes += result.byte_count;
    totals_.lines += result.line_count;
    totals_.errors += result.errors.size();
    totals_.problems += !result.problem.empty();
  } catch (...) {
    GoBackTo(mark);
    throw;
  }
}

BatchResult SourceRows::Read(const BatchInput& input, Reading& reading) {
  if (reading.worker == nullptr) reading.worker = std::make_unique<FileWorker>(reading.options);
  return reading.worker->Read(input, row_);
}

// Analyses a source by the reading that fits it, which is the first one to begin with.
BatchResult SourceRows::Analyze(const BatchInput& input, Reading*& reading) {
  BatchResult result = Read(input, *reading);
  const bool names_last = readings_.size() > 1 && input.bytes && NamesPython2(*input.bytes);
  for (size_t i = 1; i < readings_.size() && result.problem.empty(); ++i) {
    const bool is_named = names_last && i + 1 == readings_.size();
    if (result.errors.empty() && !is_named) continue;
    BatchResult other = Read(input, readings_[i]);
    if (!other.problem.empty()) continue;
    if (other.errors.size() < result.errors.size() || (is_named && other.errors.empty())) {
      reading = &readings_[i];
      result = std::move(other);
    }
  }
  if (result.problem.empty()) reading->worker->Write(input, result);
  return result;
}

void SourceRows::AddMessages(const BatchResult& result) {
  if (options_.form == RowForm::kFiles) return;
  const auto add = [this](Text kind, const BatchResult::Message& message) {
    BatchResult::Message shown{message.line, message.column, {}};
    AppendShown(message.text, shown.text);
    Room().AddMessage(kind, shown);
  };
  if (!result.problem.empty()) add("problem", {1, 1, result.problem});
  for (const BatchResult::Message& message : result.errors) add("error", message);
  for (const BatchResult::Message& message : result.reports) add("report", message);
}

}  // namespace quillet
