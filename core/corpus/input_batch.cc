// Formats as the interface spells them: one letter for most types, a prefix for those with parameters.
#include "corpus/input_batch.h"

#include <charconv>
#include <cstring>

#include "foundations/errors.h"

namespace quillet {

namespace {

template <class Value>
Value ValueAt(const void* values, size_t index) {
  Value value;
  std::memcpy(&value, static_cast<const char*>(values) + index * sizeof(Value), sizeof(Value));
  return value;
}

bool TestBit(const void* bits, size_t index) {
  return (static_cast<const uint8_t*>(bits)[index / 8] >> index % 8 & 1) != 0;
}

// The number behind the last comma or colon of a format.
size_t LastNumberOf(Text format) {
  const size_t at = format.find_last_of(",:") + 1;
  size_t number = 0;
  std::from_chars(format.data() + at, format.data() + format.size(), number);
  return number;
}

// The bytes of a value of a fixed size; 0 for what is none.
size_t WidthOf(Text format) {
  if (format.size() == 1) {
    switch (format[0]) {
      case 'c':
      case 'C':
        return 1;
      case 's':
      case 'S':
      case 'e':
        return 2;
      case 'i':
      case 'I':
      case 'f':
        return 4;
      case 'l':
      case 'L':
      case 'g':
        return 8;
      default:
        return 0;
    }
  }
  if (format.starts_with("w:")) return LastNumberOf(format);
  if (format.starts_with("d:")) {
    // Precision, scale and, where it is not 128, the number of bits.
    const bool says_bits = format.find(',') != format.rfind(',');
    return says_bits ? LastNumberOf(format) / 8 : 16;
  }
  if (format == "tdD" || format == "tts" || format == "ttm" || format == "tiM") return 4;
  if (format == "tdm" || format == "ttu" || format == "ttn" || format == "tiD") return 8;
  if (format == "tin") return 16;
  if (format.starts_with("ts") || format.starts_with("tD")) return 8;
  return 0;
}

std::string NameOf(const ArrowSchema& schema) { return schema.name != nullptr ? schema.name : ""; }

}  // namespace

// ---- columns ----

InputColumn::InputColumn(const ArrowSchema& schema, const ArrowArray& array, int64_t offset)
    : array_(&array), offset_(static_cast<size_t>(array.offset + offset)) {
  const Text format = schema.format;
  if (schema.dictionary != nullptr && array.dictionary != nullptr) {
    dictionary_ = std::make_unique<InputColumn>(*schema.dictionary, *array.dictionary, 0);
    index_format_ = format[0];
    form_ = dictionary_->form_;
    format_ = dictionary_->format_;
    width_ = dictionary_->width_;
    return;
  }
  SetLayout(format);
  if (layout_ == Layout::kNull && format != "n") {
    ThrowError(ErrorKind::kTypeError, "column '" + NameOf(schema) + "' is of a type that is not read here: '" +
                                          std::string(format) + "', as Arrow's C data interface spells it");
  }
}

void InputColumn::SetLayout(Text format) {
  form_ = format == "u" || format == "U" || format == "vu" ? Form::kText : Form::kBytes;
  if (format == "u" || format == "z") {
    layout_ = Layout::kOffsets32;
  } else if (format == "U" || format == "Z") {
    layout_ = Layout::kOffsets64;
  } else if (format == "vu" || format == "vz") {
    layout_ = Layout::kViews;
  } else if (format == "b") {
    form_ = Form::kBits;
    layout_ = Layout::kBits;
  } else if (width_ = WidthOf(format); width_ != 0) {
    form_ = Form::kFixed;
    layout_ = Layout::kFixed;
    format_ = format;
  } else {
    form_ = Form::kNull;
  }
}

size_t InputColumn::IndexAt(size_t row) const {
  const void* values = array_->buffers[1];
  const size_t at = offset_ + row;
  switch (index_format_) {
    case 'c':
    case 'C':
      return ValueAt<uint8_t>(values, at);
    case 's':
    case 'S':
      return ValueAt<uint16_t>(values, at);
    case 'i':
    case 'I':
      return ValueAt<uint32_t>(values, at);
    default:
      return static_cast<size_t>(ValueAt<uint64_t>(values, at));
  }
}

bool InputColumn::IsNull(size_t row) const {
  if (layout_ == Layout::kNull && dictionary_ == nullptr) return true;
  const void* validity = array_->buffers[0];
  if (array_->null_count != 0 && validity != nullptr && !TestBit(validity, offset_ + row)) return true;
  return dictionary_ != nullptr && dictionary_->IsNull(IndexAt(row));
}

Text InputColumn::At(size_t row) const {
  if (dictionary_ != nullptr) return dictionary_->At(IndexAt(row));
  const size_t at = offset_ + row;
  const void* values = array_->buffers[1];
  const auto bytes = [](const void* data, int64_t begin, int64_t end) {
    return begin == end ? Text() : Text(static_cast<const char*>(data) + begin, static_cast<size_t>(end - begin));
  };
  switch (layout_) {
    case Layout::kOffsets32:
      return bytes(array_->buffers[2], ValueAt<int32_t>(values, at), ValueAt<int32_t>(values, at + 1));
    case Layout::kOffsets64:
      return bytes(array_->buffers[2], ValueAt<int64_t>(values, at), ValueAt<int64_t>(values, at + 1));
    case Layout::kFixed:
      return Text(static_cast<const char*>(values) + at * width_, width_);
    case Layout::kViews: {
      // The size, then the bytes themselves where they are few, or else their first four, a buffer and a place.
      constexpr int32_t kMostInline = 12;
      const char* view = static_cast<const char*>(values) + at * 16;
      const auto size = ValueAt<int32_t>(view, 0);
      if (size <= kMostInline) return Text(view + 4, static_cast<size_t>(size));
      const auto place = ValueAt<int32_t>(view, 3);
      return bytes(array_->buffers[2 + ValueAt<int32_t>(view, 2)], place, int64_t{place} + size);
    }
    case Layout::kBits:
    case Layout::kNull:
      break;
  }
  return {};
}

bool InputColumn::BitAt(size_t row) const {
  return dictionary_ != nullptr ? dictionary_->BitAt(IndexAt(row)) : TestBit(array_->buffers[1], offset_ + row);
}

// ---- batches ----

InputBatch::InputBatch(ArrowSchema& schema, ArrowArray& array) : schema_(schema), array_(array) {
  schema.release = nullptr;
  array.release = nullptr;
  if (Text(schema_.format) != "+s" || schema_.n_children != array_.n_children) {
    Release();
    ThrowError(ErrorKind::kTypeError, "a record batch is needed");
  }
}

InputBatch::~InputBatch() { Release(); }

void InputBatch::Release() {
  if (array_.release != nullptr) array_.release(&array_);
  if (schema_.release != nullptr) schema_.release(&schema_);
}

InputColumn InputBatch::ColumnOf(const std::string& name) const {
  std::string others;
  for (int64_t i = 0; i < schema_.n_children; ++i) {
    const ArrowSchema& column = *schema_.children[i];
    if (NameOf(column) == name) return {column, *array_.children[i], array_.offset};
    others += (others.empty() ? "" : ", ") + NameOf(column);
  }
  ThrowError(ErrorKind::kValueError, "there is no column '" + name + "'; there are: " + others);
}

}  // namespace quillet
