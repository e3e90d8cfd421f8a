// A record batch that a host hands in through the Arrow C data interface, read row by row.
//
// Texts and bytes come in many layouts (32-bit offsets, 64-bit ones, views, a dictionary of any of them), and are
// the same to who reads them here. Numbers, dates and the like are values of a fixed size, truth values bits.
// Nested columns are not read.
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>

#include "foundations/text.h"
#include "output/arrow_data.h"

namespace quillet {

class InputColumn {
 public:
  enum class Form { kText, kBytes, kFixed, kBits, kNull };

  // TypeError for a layout that is not read. The schema and the array stand as long as the column is used;
  // `offset` is that of the batch.
  InputColumn(const ArrowSchema& schema, const ArrowArray& array, int64_t offset);

  Form form() const { return form_; }
  // Of kFixed: how its type is spelled, and the bytes of a value.
  const std::string& format() const { return format_; }
  size_t width() const { return width_; }

  bool IsNull(size_t row) const;
  // Of kText, kBytes and kFixed, where it is not null: its bytes.
  Text At(size_t row) const;
  bool BitAt(size_t row) const;

 private:
  enum class Layout { kOffsets32, kOffsets64, kViews, kFixed, kBits, kNull };

  void SetLayout(Text format);
  size_t IndexAt(size_t row) const;

  const ArrowArray* array_;
  size_t offset_;
  Form form_ = Form::kNull;
  Layout layout_ = Layout::kNull;
  std::string format_;
  size_t width_ = 0;
  std::unique_ptr<InputColumn> dictionary_;
  char index_format_ = 0;
};

class InputBatch {
 public:
  // Takes both over, and leaves them released. TypeError where they are no record batch.
  InputBatch(ArrowSchema& schema, ArrowArray& array);
  ~InputBatch();
  InputBatch(const InputBatch&) = delete;
  InputBatch& operator=(const InputBatch&) = delete;

  size_t size() const { return static_cast<size_t>(array_.length); }
  // ValueError where there is none of this name, with those that there are.
  InputColumn ColumnOf(const std::string& name) const;

 private:
  void Release();

  ArrowSchema schema_;
  ArrowArray array_;
};

}  // namespace quillet
