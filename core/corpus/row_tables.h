// Rows about sources as columns that every reader of Arrow takes as they are: signed numbers, truth values and
// plain strings with 32-bit offsets.
//
// In front of a table's own columns stand those that were carried along from the rows of the input, and the path.
// A row with an `error` is about a file and no record: "error" (of syntax), "report" (a statement was given up for
// another reason) or "problem" (the file could not be read at all) where a record has its kind, the message in
// `error`, the place, and nothing in the other columns.
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "analysis/file_worker.h"
#include "corpus/input_batch.h"
#include "names/bindings.h"
#include "output/arrow_export.h"

namespace quillet {

// Texts with 32-bit offsets; rows that may be missing.
class TextColumn {
 public:
  size_t size() const { return offsets_.size() - 1; }
  size_t byte_size() const { return bytes_.size(); }
  void Add(Text text) {
    bytes_.append(text);
    offsets_.push_back(static_cast<int32_t>(bytes_.size()));
  }
  void Repeat(Text text, size_t count);
  void Truncate(size_t size);
  ColumnBuffers Buffers(const Bits* validity = nullptr) const {
    return {{offsets_.data(), bytes_.data()}, {}, validity};
  }

 private:
  std::vector<int32_t> offsets_{0};
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

  explicit RowTable(std::vector<CarriedColumn> carried) : carried_(std::move(carried)) {}

  std::vector<Column> Schema() const;
  bool IsFull() const { return size() >= kMostRows || byte_size() >= kMostBytes; }

  // Each has to be followed by a Carry, sooner or later.
  virtual void AddRecord(const PlacedRecord&, Text /*scope*/) {}
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

 private:
  std::vector<CarriedColumn> carried_;
  size_t carried_rows_ = 0;
};

enum class RowForm : uint8_t { kRecords, kOccurrences, kFiles };

std::shared_ptr<RowTable> MakeRowTable(RowForm form, std::vector<CarriedColumn> carried);

}  // namespace quillet
