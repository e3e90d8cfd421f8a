// An open table of words, which is cleared for each file, and a pass over the placed records.
#include "index/words.h"

#include <algorithm>
#include <bit>
#include <cstring>

#include "index/bytes.h"

namespace quillet {

namespace {

constexpr uint64_t kFactor = 0x9E3779B97F4A7C15;

uint64_t LoadEight(const char* at) {
  uint64_t value = 0;
  if constexpr (std::endian::native == std::endian::little) {
    std::memcpy(&value, at, 8);
  } else {
    for (int i = 8; i-- > 0;) value = value << 8 | static_cast<unsigned char>(at[i]);
  }
  return value;
}

uint64_t Mixed(uint64_t hash, uint64_t value) {
  hash = (hash ^ value) * kFactor;
  return hash ^ hash >> 32;
}

// Whether what stands behind a name leaves it the whole of what is raised, or of what is called for it.
bool EndsRaised(Text behind) {
  behind = behind.substr(std::min(behind.find_first_not_of(" \t\f\\"), behind.size()));
  if (behind.empty() || Text("\r\n#();,").find(behind.front()) != Text::npos) return true;
  return behind.starts_with("from") && (behind.size() == 4 || !IsWordByte(behind[4]));
}

// Nothing that anybody raises stands behind more of them. Each attribute of a chain may be asked for what it begins
// with.
constexpr int kMostReceivers = 30;

// Whether `raise` stands in front of a name, or of what it is an attribute of.
bool IsRaised(const Occurrence& occurrence, const Bindings& bindings, Text text) {
  constexpr Text kRaise = "raise";
  if (!EndsRaised(text.substr(bindings.EndOf(occurrence)))) return false;
  const Occurrence* root = &occurrence;
  for (int receivers = 0;; ++receivers) {
    const uint32_t receiver = bindings.ReceiverOf(static_cast<uint32_t>(root - bindings.occurrences.data()));
    if (receiver == kNoIndex) break;
    if (receivers == kMostReceivers) return false;
    root = &bindings.occurrences[receiver];
  }
  const Text before = text.substr(0, root->begin);
  const size_t end = before.find_last_not_of(" \t(") + 1;
  if (end == before.size() || !before.substr(0, end).ends_with(kRaise)) return false;
  return end == kRaise.size() || !IsWordByte(before[end - kRaise.size() - 1]);
}

class WordsWriter : public FileWriter {
 public:
  explicit WordsWriter(Version version) : binder_(version) {}

  void Write(const BatchInput&, const FileAnalyzer& file, const ScopeNames& scopes, PlacedRecords& placed,
             std::string& out) override {
    table_.Clear();
    uint64_t records = 0;
    placed.Begin(file, scopes);
    for (size_t row = 0; row < file.rows().size(); ++row) {
      if (file.results()[row].record_begin == file.results()[row].record_end &&
          file.results()[row].arg_record_begin == file.results()[row].arg_record_end)
        continue;
      Text before;
      uint32_t last = 0;
      for (const PlacedRecord& record : placed.OfRow(row)) {
        ++records;
        const bool goes_on = record.name.data() == before.data() && record.name.size() >= before.size();
        if (!goes_on || record.name.size() != before.size()) {
          ForEachWord(record.name, goes_on ? before.size() : 0, [&](Text word, bool) { last = table_.NumberOf(word); });
          // A name that ends in no word uses the one that the name before ended in.
          before = record.name;
        }
        table_[last].uses |= UseOf(record);
      }
    }
    const Bindings& bindings = binder_.Bind(file.source(), file.rows());
    for (const Occurrence& occurrence : bindings.occurrences)
      table_[table_.NumberOf(WordOf(bindings.TextOf(occurrence)))].uses |= UsesOf(occurrence, bindings, file.source());
    for (const Text scope : scopes.names()) {
      const Text own_name = scope.substr(scope.rfind('.') + 1);
      if (own_name.empty()) continue;
      ForEachWord(own_name, 0, [&](Text word, bool is_last) {
        const uint32_t number = table_.NumberOf(word);
        if (is_last) table_[number].uses |= kScopeUse;
      });
    }

    AppendFixed(HashOfBytes(file.source().text()), out);
    AppendNumber(records, out);
    AppendNumber(table_.entries().size(), out);
    for (const auto& [word, uses] : table_.entries()) {
      AppendText(word, out);
      AppendNumber(uses, out);
    }
  }

 private:
  static Text WordOf(Text name) { return name.substr(0, kMaxWordSize); }

  WordTable table_;
  NameBinder binder_;
};

}  // namespace

Uses UsesOf(const Occurrence& occurrence, const Bindings& bindings, const SourceText& source) {
  Uses uses = 0;
  if (occurrence.role != NameRole::kDefinition) {
    uses = UseOfRole(occurrence.role);
  } else {
    switch (occurrence.kind) {
      case NameKind::kParameter:
        uses = kParameterUse;
        break;
      case NameKind::kClass:
      case NameKind::kFunction:
      case NameKind::kTypeAlias:
        uses = UseOfRole(NameRole::kDefinition) | kDefineUse;
        break;
      case NameKind::kImport:
        uses = UseOfRole(NameRole::kDefinition) | UseOfRole(NameRole::kImport);
        break;
      default:
        uses = UseOfRole(NameRole::kDefinition);
    }
  }
  if ((occurrence.flags & kNameDecorator) != 0) uses |= kDecoratorUse;
  if ((occurrence.flags & kNameBase) != 0) uses |= kBaseUse;
  if ((occurrence.flags & kNameAnnotation) != 0) uses |= kAnnotationUse;
  const bool is_used = occurrence.role == NameRole::kRead || occurrence.role == NameRole::kCall;
  if (is_used && IsRaised(occurrence, bindings, source.text())) uses |= kRaiseUse;
  return uses;
}

uint64_t HashOfBytes(Text bytes) {
  uint64_t hash = bytes.size() * kFactor;
  size_t at = 0;
  for (; at + 8 <= bytes.size(); at += 8) hash = Mixed(hash, LoadEight(bytes.data() + at));
  char rest[8] = {};
  std::memcpy(rest, bytes.data() + at, bytes.size() - at);
  return Mixed(hash, LoadEight(rest));
}

void WordTable::Clear() {
  entries_.clear();
  hashes_.clear();
  std::fill(slots_.begin(), slots_.end(), 0);
  texts_.Reset();
}

uint32_t WordTable::NumberOf(Text word) {
  if (entries_.size() * 2 >= slots_.size()) Grow();
  const uint64_t hash = HashOfBytes(word);
  const size_t mask = slots_.size() - 1;
  for (size_t slot = hash & mask;; slot = (slot + 1) & mask) {
    const uint32_t number = slots_[slot];
    if (number == 0) {
      entries_.push_back({word, 0});
      hashes_.push_back(hash);
      return (slots_[slot] = static_cast<uint32_t>(entries_.size())) - 1;
    }
    if (hashes_[number - 1] == hash && entries_[number - 1].word == word) return number - 1;
  }
}

uint32_t WordTable::NumberOfCopy(Text word) {
  const size_t count = entries_.size();
  const uint32_t number = NumberOf(word);
  if (entries_.size() != count) entries_[number].word = texts_.Copy(word);
  return number;
}

void WordTable::Grow() {
  slots_.assign(std::max<size_t>(slots_.size() * 2, 1024), 0);
  const size_t mask = slots_.size() - 1;
  for (uint32_t number = 0; number < entries_.size(); ++number) {
    size_t slot = hashes_[number] & mask;
    while (slots_[slot] != 0) slot = (slot + 1) & mask;
    slots_[slot] = number + 1;
  }
}

std::unique_ptr<FileWriter> MakeWordsWriter(Version version) { return std::make_unique<WordsWriter>(version); }

bool ReadFileWords(Text written, FileWords& words) {
  ByteReader reader(written);
  words.hash = reader.Fixed();
  words.records = static_cast<uint32_t>(reader.NumberUpTo(UINT32_MAX));
  const uint64_t count = reader.NumberUpTo(written.size());
  words.words.clear();
  for (uint64_t i = 0; i < count && !reader.failed(); ++i) {
    const Text word = reader.String();
    words.words.push_back({word, static_cast<Uses>(reader.NumberUpTo(UINT32_MAX))});
  }
  return !reader.failed() && reader.left() == 0;
}

}  // namespace quillet
