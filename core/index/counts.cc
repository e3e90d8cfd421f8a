// One table of names a file, and one for their sum.
#include "index/counts.h"

#include <algorithm>

#include "index/bytes.h"

namespace quillet {

namespace {

class CountsWriter : public FileWriter {
 public:
  void Write(const BatchInput&, const FileAnalyzer& file, const ScopeNames& scopes, PlacedRecords& placed,
             std::string& out) override {
    std::vector<uint64_t> kinds(RecordKindWords().size());
    names_.Clear();
    counts_.clear();
    placed.Begin(file, scopes);
    for (size_t row = 0; row < file.rows().size(); ++row) {
      for (const PlacedRecord& record : placed.OfRow(row)) {
        ++kinds[static_cast<size_t>(record.kind)];
        // What a function gives and what a star imports is no name.
        if (record.name == "return" || record.name == "yield" || record.name == "*") continue;
        const uint32_t name = names_.NumberOf(record.name);
        if (name == counts_.size()) counts_.push_back(0);
        ++counts_[name];
      }
    }
    for (const uint64_t count : kinds) AppendNumber(count, out);
    for (uint32_t name = 0; name < counts_.size(); ++name) {
      AppendText(names_[name].word, out);
      AppendNumber(counts_[name], out);
    }
  }

 private:
  WordTable names_;
  std::vector<uint64_t> counts_;
};

}  // namespace

std::unique_ptr<FileWriter> MakeCountsWriter() { return std::make_unique<CountsWriter>(); }

bool RecordCounts::Add(Text written) {
  ByteReader reader(written);
  for (uint64_t& kind : kinds_) kind += reader.Number();
  while (reader.left() != 0 && !reader.failed()) {
    const uint32_t name = names_.NumberOfCopy(reader.String());
    if (name == counts_.size()) counts_.push_back(0);
    counts_[name] += reader.Number();
  }
  return !reader.failed();
}

std::vector<std::pair<Text, uint64_t>> RecordCounts::MostUsed(size_t count) const {
  std::vector<std::pair<Text, uint64_t>> names;
  names.reserve(counts_.size());
  for (size_t i = 0; i < counts_.size(); ++i) names.emplace_back(names_.entries()[i].word, counts_[i]);
  const auto first = names.begin();
  const auto behind = first + static_cast<ptrdiff_t>(std::min(count, names.size()));
  std::partial_sort(first, behind, names.end(), [](const auto& a, const auto& b) {
    return a.second != b.second ? a.second > b.second : a.first < b.first;
  });
  names.erase(behind, names.end());
  return names;
}

}  // namespace quillet
