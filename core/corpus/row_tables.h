// Rows about sources as columns that every reader of Arrow takes as they are: signed numbers, truth values and
// plain strings with 32-bit offsets.
//
// In front of a table's own columns stand those that were carried along from the rows of the input, and the path.
// A row with an `error` is about a file and no record: "error" (of syntax), "report" (a statement was given up for
// another reason) or "problem" (the file could not be read at all) where a record has its kind, the message in
// `error`, the place, and nothing in the other columns.
//
// In a table that is to be sorted, texts are numbered: copied once each, and compared once each.
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <span>
#include <string>
#include <vector>

#include "analysis/file_worker.h"
#include "corpus/column_texts.h"
#include "corpus/input_batch.h"
#include "names/bindings.h"
#include "output/arrow_export.h"

namespace quillet {

enum class TextForm : uint8_t { kPlain, kNumbered };

// More values at the end of a column, which are to be set.
template <class Number>
Number* AddTo(std::vector<Number>& numbers, size_t count) {
  numbers.resize(numbers.size() + count);
  return numbers.data() + numbers.size() - count;
}

// Texts with 32-bit offsets, or a ColumnTexts and their numbers in it; rows that may be missing. A copy of one with
// numbers shares them.
class TextColumn {
 public:
  // With numbers there is room for so many rows.
  explicit TextColumn(TextForm form = TextForm::kPlain, size_t rows = 0) {
    if (form == TextForm::kPlain) {
      offsets_.push_back(0);
    } else {
      texts_ = std::make_shared<ColumnTexts>();
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
  // The texts of one with numbers, and rows of what was looked up in them.
  bool has_numbers() const { return texts_ != nullptr; }
  ColumnTexts& texts() { return *texts_; }
  void AddNumber(uint32_t number) { numbers_.push_back(number); }
  // The numbers of more rows, which are to be set.
  uint32_t* AddNumbers(size_t count) { return AddTo(numbers_, count); }
  // Of texts that are known before: the numbers of them all.
  std::span<const uint32_t> NumbersOf(std::span<const Text> words) {
    while (word_numbers_.size() < words.size()) word_numbers_.push_back(texts_->NumberOf(words[word_numbers_.size()]));
    return word_numbers_;
  }
  // In rows that have none.
  void AddNone(size_t count = 1) {
    if (texts_ != nullptr)
      numbers_.resize(numbers_.size() + count);
    else
      offsets_.resize(offsets_.size() + count, offsets_.back());
  }
  void Repeat(Text text, size_t count);
  void Truncate(size_t size);
  // The values are offsets and bytes, or numbers and the ColumnTexts.
  ColumnBuffers Buffers(const Bits* validity = nullptr) const {
    if (texts_ != nullptr) return {{numbers_.data(), texts_.get()}, {}, validity};
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
  // Records that are added between two looks at whether a table is full, and whose texts are looked up together.
  static constexpr size_t kRowsAtOnce = 16;

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
  // Takes all rows behind the first ones away, whether they were completed or not. A table without rows is as good as
  // a new one, and has its memory already.
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
  size_t room() const { return most_rows_ + kRowsAtOnce; }

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
