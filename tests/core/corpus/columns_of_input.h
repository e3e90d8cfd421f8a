// Tables for a test to hand in, in all layouts of Arrow that there are.
#pragma once

#include <deque>
#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "corpus/input_batch.h"
#include "output/arrow_export.h"

namespace quillet::testing {

class InputTable : public ColumnTable {
 public:
  using Texts = std::vector<std::optional<std::string>>;

  // "u", "z", "U", "Z", "vu" or "vz"; "di" for a dictionary with 32-bit places.
  InputTable& Add(std::string name, const std::string& layout, const Texts& texts) {
    size_ = texts.size();
    const Bits* validity = AddValidity(texts);
    if (layout == "di") {
      schema_.push_back({std::move(name), "i", "U", true});
      TextList& list = lists_.emplace_back();
      const void* places = AddNumbers<int32_t>(texts.size(), [&](size_t i) {
        list.Add(texts[i].value_or(""));
        return static_cast<int32_t>(i);
      });
      buffers_.push_back({{places}, ColumnBuffers::DictionaryOf(list), validity});
      return *this;
    }
    schema_.push_back({std::move(name), layout, {}, true});
    std::string& bytes = bytes_.emplace_back();
    if (layout[0] == 'v') {
      std::string& views = bytes_.emplace_back();
      for (const auto& text : texts) AppendView(text.value_or(""), bytes, views);
      buffers_.push_back({{views.data(), bytes.data()}, {}, validity});
      return *this;
    }
    const auto end = [&](size_t i) {
      if (i > 0) bytes += texts[i - 1].value_or("");
      return bytes.size();
    };
    const bool is_large = layout == "U" || layout == "Z";
    const void* offsets = is_large
                              ? AddNumbers<int64_t>(size_ + 1, [&](size_t i) { return static_cast<int64_t>(end(i)); })
                              : AddNumbers<int32_t>(size_ + 1, [&](size_t i) { return static_cast<int32_t>(end(i)); });
    buffers_.push_back({{offsets, bytes.data()}, {}, validity});
    return *this;
  }

  InputTable& AddNumbers(std::string name, const std::vector<int32_t>& numbers) {
    size_ = numbers.size();
    schema_.push_back({std::move(name), "i", {}});
    buffers_.push_back({{AddNumbers<int32_t>(size_, [&](size_t i) { return numbers[i]; })}});
    return *this;
  }

  // Values of a fixed size, as their bytes.
  InputTable& AddFixed(std::string name, const std::string& layout, const std::vector<std::string>& values) {
    size_ = values.size();
    schema_.push_back({std::move(name), layout, {}});
    std::string& bytes = bytes_.emplace_back();
    for (const std::string& value : values) bytes += value;
    buffers_.push_back({{bytes.data()}});
    return *this;
  }

  size_t size() const override { return size_; }
  std::vector<ColumnBuffers> Buffers() const override { return buffers_; }
  const std::vector<Column>& schema() const { return schema_; }

 private:
  const Bits* AddValidity(const Texts& texts) {
    Bits& bits = bits_.emplace_back();
    for (const auto& text : texts) bits.Add(text.has_value());
    return &bits;
  }
  template <class Number, class NumberAt>
  const void* AddNumbers(size_t count, const NumberAt& number_at) {
    std::string& numbers = bytes_.emplace_back();
    for (size_t i = 0; i < count; ++i) {
      const Number number = number_at(i);
      numbers.append(reinterpret_cast<const char*>(&number), sizeof number);
    }
    return numbers.data();
  }
  static void AppendView(const std::string& text, std::string& bytes, std::string& views) {
    const auto size = static_cast<int32_t>(text.size());
    std::string view(reinterpret_cast<const char*>(&size), 4);
    if (text.size() <= 12) {
      view += text;
    } else {
      const int32_t rest[] = {0, static_cast<int32_t>(bytes.size())};
      view += text.substr(0, 4);
      view.append(reinterpret_cast<const char*>(rest), 8);
      bytes += text;
    }
    view.resize(16);
    views += view;
  }

  size_t size_ = 0;
  std::vector<Column> schema_;
  std::vector<ColumnBuffers> buffers_;
  std::deque<std::string> bytes_;
  std::deque<TextList> lists_;
  std::deque<Bits> bits_;
};

inline std::unique_ptr<InputBatch> BatchOf(const std::shared_ptr<const InputTable>& table) {
  ArrowSchema schema;
  ArrowArray array;
  FillTableSchema(table->schema(), &schema);
  FillTableArray(table, &array);
  return std::make_unique<InputBatch>(schema, array);
}

}  // namespace quillet::testing
