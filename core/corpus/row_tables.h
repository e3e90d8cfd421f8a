// Rows about sources as columns that every reader of Arrow takes as they are: signed numbers, truth values and
// plain strings with 32-bit offsets.
//
// In front of a table's own columns stand those that were carried along from the rows of the input, and the path.
// A row with an `error` is about a file and no record: "error" (of syntax), "report" (a statement was given up for
// another reason) or "problem" (the file could not be read at all) where a record has its kind, the message in
// `error`, the place, and nothing in the other columns.
//
// In a table that is to be sorted, texts are dictionaries: copied once each, and compared once each.
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <span>
#include <string>
#include <vector>

#include "analysis/file_worker.h"
#include "corpus/input_batch.h"
#include "names/bindings.h"
#include "names/text_table.h"
#include "output/arrow_export.h"

namespace quillet {

// The texts of a column, each once.
class ColumnTexts {
 public:
  // For so many rows.
  explicit ColumnTexts(size_t rows) { table_.Begin(rows / kRowsOfAText); }

  uint32_t NumberOf(Text text) {
    // Many rows have what the one before them has.
    if (last_ < table_.size() && table_.TextOf(last_) == text) return last_;
    const size_t count = table_.size();
    last_ = table_.NumberOfCopy(text);
    if (table_.size() != count) byte_size_ += text.size();
    return last_;
  }
  // For texts whose numbers are asked for soon; see TextTable.
  void FetchSlot(Text text) const { table_.FetchSlot(text); }
  void FetchEntry(Text text) const { table_.FetchEntry(text); }
  size_t byte_size() const { return byte_size_; }
  // All of them, in the order of their numbers. They stand until one is added.
  ColumnBuffers::Texts Listed() {
    table_.CopyTo(list_);
    return ColumnBuffers::DictionaryOf(list_);
  }

 private:
  static constexpr size_t kRowsOfAText = 16;  // more or less

  TextTable table_;
  TextList list_;
  uint32_t last_ = 0;
  size_t byte_size_ = 0;
};

enum class TextForm : uint8_t { kPlain, kNumbered };

// Texts with 32-bit offsets, or a dictionary of them and their numbers; rows that may be missing. A copy of one with
// numbers shares them.
class TextColumn {
 public:
  // With numbers there is room for so many rows.
  explicit TextColumn(TextForm form = TextForm::kPlain, size_t rows = 0) {
    if (form == TextForm::kPlain) {
      offsets_.push_back(0);
    } else {
      texts_ = std::make_shared<ColumnTexts>(rows);
      numbers_.reserve(rows);
    }
  }

  size_t byte_size() const { return texts_ != nullptr ? texts_->byte_size() : bytes_.size(); }
  void Add(Text text) {
    if (texts_ != nullptr) {
      numbers_.push_back(texts_->NumberOf(text));
    } else {
      bytes_.append(text);
      offsets_.push_back(static_cast<int32_t>(bytes_.size()));
    }
  }
  // Of a text that is asked for often: its number, and a row of it.
  bool has_numbers() const { return texts_ != nullptr; }
  uint32_t NumberOf(Text text) { return texts_->NumberOf(text); }
  void AddNumber(uint32_t number) { numbers_.push_back(number); }
  void FetchSlot(Text text) const { texts_->FetchSlot(text); }
  void FetchEntry(Text text) const { texts_->FetchEntry(text); }
  // A text of a few that are known before, by its number among them.
  void AddWord(size_t word, std::span<const Text> words) {
    if (texts_ == nullptr) return Add(words[word]);
    while (word_numbers_.size() < words.size()) word_numbers_.push_back(texts_->NumberOf(words[word_numbers_.size()]));
    numbers_.push_back(word_numbers_[word]);
  }
  // In a row that has none.
  void AddNone() {
    if (texts_ == nullptr)
      Add({});
    else
      numbers_.push_back(0);
  }
  void Repeat(Text text, size_t count);
  void Truncate(size_t size);
  ColumnBuffers Buffers(const Bits* validity = nullptr) const {
    if (texts_ != nullptr) return {{numbers_.data()}, texts_->Listed(), validity};
    return {{offsets_.data(), bytes_.data()}, {}, validity};
  }

 private:
  std::shared_ptr<ColumnTexts> texts_;
  std::vector<uint32_t> numbers_;
  std::vector<uint32_t> word_numbers_;
  std::vector<int32_t> offsets_;
  std::string bytes_;
};

// A column that comes from the input. A text comes out as a plain string whatever its layout was, and bytes of any
// layout as plain ones; a dictionary is resolved; all others keep their type. Odd bytes of what has to be a text are
// spelt out.
class CarriedColumn {
 public:
  // What it is like; the values come later. TypeError where it has to be a text and is none.
  CarriedColumn(std::string name, const InputColumn& input, bool must_be_text);

  const Column& schema() const { return schema_; }
  bool has_schema_of(const CarriedColumn& other) const { return schema_.format == other.schema_.format; }

  // Before the first value.
  void SetTextForm(TextForm form, size_t rows) { texts_ = TextColumn(form, rows); }

  // The value of an input's row, `count` times.
  void Repeat(const InputColumn& input, size_t row, size_t count);
  void Truncate(size_t size);
  size_t byte_size() const { return texts_.byte_size() + fixed_.size(); }
  ColumnBuffers Buffers() const;

 private:
  InputColumn::Form form_;
  Column schema_;
  size_t width_;
  size_t size_ = 0;
  TextColumn texts_;
  std::string fixed_;
  Bits bits_;
  Bits validity_;
};

// What a table is filled from: the columns of an input batch and the row that is its turn.
struct InputRow {
  const std::vector<InputColumn>* columns;  // as many as are carried
  size_t row;
};

class RowTable : public ColumnTable {
 public:
  // Rows, and bytes of text, that make a batch worth while.
  static constexpr size_t kMostRows = size_t{1} << 16;
  static constexpr size_t kMostBytes = size_t{16} << 20;

  RowTable(std::vector<CarriedColumn> carried, TextForm text_form, size_t most_rows);

  // Types as they are where texts are plain.
  std::vector<Column> Schema() const;
  bool IsFull() const { return size() >= most_rows_ || byte_size() >= kMostBytes; }

  // Each has to be followed by a Carry, sooner or later.
  virtual void AddRecords(std::span<const PlacedRecord>, std::span<const Text> /*scopes*/) {}
  virtual void AddOccurrence(const Bindings&, uint32_t /*index*/, const std::vector<std::string>& /*scope_names*/) {}
  virtual void AddMessage(Text /*kind*/, const BatchResult::Message&) {}
  virtual void AddFile(const BatchResult&, Text /*python*/) {}
  // Completes the rows that were added with what is carried from the input.
  void Carry(const InputRow& input);
  // Takes all rows behind the first ones away, whether they were completed or not.
  void Truncate(size_t size);

  size_t byte_size() const;
  std::vector<ColumnBuffers> Buffers() const final;

 protected:
  virtual std::vector<Column> OwnSchema() const = 0;
  virtual std::vector<ColumnBuffers> OwnBuffers() const = 0;
  virtual size_t own_byte_size() const = 0;
  virtual void TruncateOwn(size_t size) = 0;
  // What was noted of the source is of use no longer.
  virtual void ForgetSource() {}

  // With what a table's own columns are made.
  TextForm text_form() const { return text_form_; }
  size_t most_rows() const { return most_rows_; }

 private:
  TextForm text_form_;
  size_t most_rows_;
  std::vector<CarriedColumn> carried_;
  size_t carried_rows_ = 0;
};

enum class RowForm : uint8_t { kRecords, kOccurrences, kFiles };

// With `numbered_rows` a table of so many rows, whose texts are numbered.
std::shared_ptr<RowTable> MakeRowTable(RowForm form, std::vector<CarriedColumn> carried, size_t numbered_rows = 0);

}  // namespace quillet
