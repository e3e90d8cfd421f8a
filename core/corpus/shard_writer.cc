// Sources go through the same door as those of other hosts: as record batches.
#include "corpus/shard_writer.h"

#include <algorithm>
#include <utility>

namespace quillet {

namespace {

// What is analysed at once.
constexpr size_t kBatchRows = 256;
constexpr size_t kBatchBytes = size_t{2} << 20;

Text KeyOf(RowForm form) {
  switch (form) {
    case RowForm::kRecords:
      return "name";
    case RowForm::kOccurrences:
      return "text";
    case RowForm::kFiles:
      break;
  }
  return "path";
}

// The columns of a form as they are in its file, and the place of those that it is sorted by.
std::pair<std::vector<Column>, size_t> FileSchemaOf(RowForm form) {
  std::vector<Column> columns = {{"package", "u", {}, true}, {"source", "u", {}, true}, {"path", "u", {}, true}};
  for (Column& column : MakeRowTable(form, {})->Schema()) columns.push_back(std::move(column));
  const auto key =
      std::find_if(columns.begin(), columns.end(), [form](const Column& column) { return column.name == KeyOf(form); });
  const auto at = static_cast<size_t>(key - columns.begin());
  return {std::move(columns), at};
}

}  // namespace

// Sources that wait.
class ShardWriter::Sources : public ColumnTable {
 public:
  explicit Sources(bool is_text) : is_text_(is_text) {}

  bool is_text() const { return is_text_; }
  bool IsFull() const { return size_ >= kBatchRows || contents_.byte_size() >= kBatchBytes; }
  bool IsUncommon() const { return contents_.byte_size() >= 4 * kBatchBytes; }
  void Clear() {
    size_ = 0;
    for (TextColumn* texts : {&packages_, &archives_, &paths_, &contents_, &problems_}) texts->Truncate(0);
    have_content_.Truncate(0);
    have_problem_.Truncate(0);
  }

  void Add(const Source& source) {
    packages_.Add(source.package);
    archives_.Add(source.archive);
    paths_.Add(source.path);
    contents_.Add(source.content.value_or(Text()));
    have_content_.Add(source.content.has_value());
    problems_.Add(source.problem.value_or(Text()));
    have_problem_.Add(source.problem.has_value());
    ++size_;
  }

  std::vector<Column> Schema() const {
    return {{"package", "u", {}},
            {"source", "u", {}},
            {"path", "u", {}},
            {"content", is_text_ ? "u" : "z", {}, true},
            {"problem", "u", {}, true}};
  }
  size_t size() const override { return size_; }
  std::vector<ColumnBuffers> Buffers() const override {
    return {packages_.Buffers(), archives_.Buffers(), paths_.Buffers(), contents_.Buffers(&have_content_),
            problems_.Buffers(&have_problem_)};
  }

 private:
  const bool is_text_;
  size_t size_ = 0;
  TextColumn packages_;
  TextColumn archives_;
  TextColumn paths_;
  TextColumn contents_;
  Bits have_content_;
  TextColumn problems_;
  Bits have_problem_;
};

ShardWriter::ShardWriter(Options options) : options_(std::move(options)) {
  SourceRows::Options of_rows;
  of_rows.form = options_.form;
  of_rows.versions = options_.versions;
  of_rows.path_column = "path";
  of_rows.content_column = "content";
  of_rows.kept_columns = {"package", "source"};
  of_rows.problem_column = "problem";
  of_rows.decode = options_.decode;
  of_rows.numbered_rows = options_.run_rows;
  rows_ = std::make_unique<SourceRows>(std::move(of_rows));
  auto [rows_schema, rows_key] = FileSchemaOf(options_.form);
  auto [files_schema, files_key] = FileSchemaOf(RowForm::kFiles);
  rows_key_ = rows_key;
  files_key_ = files_key;
  rows_file_ = std::make_unique<ParquetFile>(std::move(rows_schema), rows_key, options_.compress);
  files_file_ = std::make_unique<ParquetFile>(std::move(files_schema), files_key, options_.compress);
}

ShardWriter::~ShardWriter() = default;

bool ShardWriter::Add(const Source& source) {
  if (sources_ != nullptr && sources_->is_text() != source.is_text && source.content) Work();
  if (sources_ == nullptr && spare_ != nullptr && spare_.use_count() == 1 && spare_->is_text() == source.is_text) {
    sources_ = std::exchange(spare_, nullptr);
    sources_->Clear();
  }
  if (sources_ == nullptr) sources_ = std::make_shared<Sources>(source.is_text);
  sources_->Add(source);
  return sources_->IsFull();
}

void ShardWriter::Work() {
  if (sources_ == nullptr) return;
  ArrowSchema schema;
  ArrowArray array;
  FillTableSchema(sources_->Schema(), &schema);
  FillTableArray(sources_, &array);
  spare_ = std::exchange(sources_, nullptr);
  if (spare_->IsUncommon()) spare_.reset();
  rows_->Begin(std::make_unique<InputBatch>(schema, array));
  bool has_written = false;
  while (const std::shared_ptr<const RowTable> table = rows_->Next()) {
    Write(table.get(), *rows_file_, rows_key_);
    has_written = true;
  }
  if (has_written) Write(rows_->TakeFiles().get(), *files_file_, files_key_);
}

void ShardWriter::WorkToTheEnd() {
  Work();
  Write(rows_->Finish().get(), *rows_file_, rows_key_);
  Write(rows_->TakeFiles().get(), *files_file_, files_key_);
}

void ShardWriter::Write(const RowTable* table, ParquetFile& file, size_t key) {
  if (table != nullptr && table->size() != 0) sorted_.Write(*table, key, options_.group_rows, file);
}

void ShardWriter::Finish(Text key, Text value) {
  rows_file_->Finish(key, value);
  files_file_->Finish(key, value);
}

ShardWriter::Totals ShardWriter::totals() const {
  const SourceRows::Totals& of_rows = rows_->totals();
  return {of_rows.files, of_rows.bytes, of_rows.lines, rows_file_->row_count(), of_rows.errors, of_rows.problems};
}

}  // namespace quillet
