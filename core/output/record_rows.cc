// The texts of a file are numbered first, each once; its rows then only hold numbers.
#include "output/record_rows.h"

#include <algorithm>
#include <array>

#include "foundations/shown_text.h"
#include "foundations/utf8.h"

namespace quillet {

namespace {

constexpr size_t kKeysAtOnce = size_t{1} << 20;

}  // namespace

RecordRows::RecordRows(Text head) : pages_(head) {
  names_.Begin(0);
  details_.Begin(0);
  names_.NumberOf("");
  details_.NumberOf("");
}

void RecordRows::SetNumbers(const TextList& texts, TextTable& table, std::vector<uint32_t>& numbers) {
  numbers.clear();
  numbers.reserve(texts.size());
  for (size_t i = 0; i < texts.size(); ++i) {
    Text text = texts[i];
    if (!IsWellFormedUtf8(text)) {
      shown_.clear();
      AppendShown(text, shown_);
      text = shown_;
    }
    numbers.push_back(table.NumberOfCopy(text));
  }
}

void RecordRows::Add(const RecordTable& records, uint64_t first_id) {
  SetNumbers(records.name_texts, names_, name_numbers_);
  SetNumbers(records.scope_texts, names_, scope_numbers_);
  SetNumbers(records.detail_texts, details_, detail_numbers_);
  for (size_t i = 0; i < records.size(); ++i) {
    const uint32_t name = name_numbers_[records.names[i]];
    const uint32_t scope = scope_numbers_[records.scopes[i]];
    const std::array columns = {name,
                                scope,
                                records.lines[i],
                                records.columns[i],
                                static_cast<uint32_t>(records.kinds[i]),
                                uint32_t{records.is_parameter[i]},
                                static_cast<uint32_t>(records.opens[i]),
                                detail_numbers_[records.details[i]]};
    table_.Add(first_id + i, columns);
    keys_.push_back({name, scope, first_id + i});
  }
}

std::string RecordRows::FinishTable() {
  std::string root = table_.Finish();
  std::sort(keys_.begin(), keys_.end());
  return root;
}

bool RecordRows::AddToIndex() {
  const size_t end = std::min(keys_.size(), indexed_ + kKeysAtOnce);
  for (; indexed_ < end; ++indexed_) {
    const Key& key = keys_[indexed_];
    index_.Add(key.id, std::array{key.name, key.scope});
  }
  return indexed_ < keys_.size();
}

std::string RecordRows::FinishIndex() { return index_.Finish(); }

}  // namespace quillet
