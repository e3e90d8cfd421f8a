// Any bytes as a record batch of sources: columns of any layout with any places in them are refused, or give rows.
//
// What hosts hand in is theirs to get right: a place outside its buffer cannot be told from one inside. So places are
// drawn inside of the buffers, and everything else from the bytes: layouts, nulls, offsets, what has which name.
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <string>
#include <vector>

#include "corpus/shard_writer.h"
#include "foundations/errors.h"
#include "tests/core/corpus/columns_of_input.h"
#include "tests/core/support/analyzer_helper.h"

namespace quillet {
namespace {

// Takes choices from the front of the bytes, then gives nothing but zeros.
class Choices {
 public:
  Choices(const uint8_t* data, size_t size) : data_(data), size_(size) {}
  size_t Below(size_t bound) { return at_ < size_ ? data_[at_++] % bound : 0; }
  std::string Bytes(size_t most) {
    const size_t size = std::min(Below(most), size_ - at_);
    at_ += size;
    return {reinterpret_cast<const char*>(data_) + at_ - size, size};
  }

 private:
  const uint8_t* data_;
  size_t size_;
  size_t at_ = 0;
};

FileAnalyzer::Options Reading(Version version) {
  FileAnalyzer::Options options;
  static_cast<CPGenAnalyzerImpl::Options&>(options) = testing::AnalyzerOptions(version);
  return options;
}

void Drain(SourceRows& rows, size_t& count) {
  while (const auto table = rows.Next()) count += table->size();
}

}  // namespace
}  // namespace quillet

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  using namespace quillet;
  static const std::vector<FileAnalyzer::Options> kReadings = {Reading(Version::Of(3, 12)), Reading(Version::Of(2, 7))};
  static const char* const kLayouts[] = {"u", "z", "U", "Z", "vu", "vz", "di"};
  static const char* const kNames[] = {"path", "content", "kept", "line"};
  Choices choices(data, size);
  SourceRows::Options options;
  options.form = static_cast<RowForm>(choices.Below(3));
  options.versions = kReadings;
  options.path_column = "path";
  options.content_column = "content";
  if (choices.Below(2) != 0) options.kept_columns = {kNames[choices.Below(4)]};
  if (choices.Below(4) == 0) options.problem_column = kNames[choices.Below(4)];
  options.numbered_rows = choices.Below(2) * 16;
  SourceRows rows(options);
  ShardWriter::Options of_shard;
  of_shard.versions = kReadings;
  of_shard.compress = [](Text bytes, std::string& compressed) { compressed = bytes; };
  of_shard.run_rows = 1 + choices.Below(64);
  of_shard.group_rows = 1 + choices.Below(64);
  ShardWriter shard(of_shard);
  size_t count = 0;
  for (size_t batch = choices.Below(3) + 1; batch > 0; --batch) {
    auto table = std::make_shared<testing::InputTable>();
    const size_t row_count = choices.Below(5);
    for (const char* name : kNames) {
      if (choices.Below(16) == 15) continue;
      if (choices.Below(8) == 7) {
        table->AddNumbers(name, std::vector<int32_t>(row_count, 7));
        continue;
      }
      testing::InputTable::Texts texts(row_count);
      for (auto& text : texts) {
        if (choices.Below(8) != 7) text = choices.Bytes(200);
      }
      table->Add(name, kLayouts[choices.Below(7)], texts);
      if (std::strcmp(name, "content") != 0) continue;
      for (const auto& text : texts) {
        ShardWriter::Source source{"p", "a", "f.py", {}, false, {}};
        if (text) source.content = *text;
        if (shard.Add(source)) shard.Work();
      }
    }
    try {
      rows.Begin(testing::BatchOf(table));
      Drain(rows, count);
    } catch (const Error&) {
      break;  // columns that do not fit
    }
  }
  if (const auto table = rows.Finish()) count += table->size();
  if (options.form == RowForm::kFiles && count != rows.totals().files) std::abort();
  shard.WorkToTheEnd();
  shard.Finish("", "");
  std::string bytes;
  shard.TakeRows(bytes);
  if (!bytes.starts_with("PAR1") || !bytes.ends_with("PAR1")) std::abort();
  return 0;
}
