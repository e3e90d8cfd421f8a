// Reading with every number checked, and writing in two passes: what there is, then numbered by use.
#include "index/name_index.h"

#include <algorithm>
#include <bit>
#include <unordered_map>
#include <utility>

#include "foundations/errors.h"
#include "index/bytes.h"

namespace quillet {

namespace {

// Begins with a byte that no text begins with and holds a line end of each kind, as a transfer would
// change them.
constexpr Text kMagic("\x93QUILLET\r\n\x1a\n", 12);
constexpr size_t kChecksumAt = 16;
constexpr size_t kHeaderSize = 24;

// A word of a file is one number: the step from the word before, and which uses, where those are among
// the most frequent ones; the number of any others follows.
constexpr unsigned kUsesBits = 4;
constexpr uint64_t kOtherUses = (1u << kUsesBits) - 1;

uint32_t SchemaOf(Text bytes) {
  uint32_t schema = 0;
  for (size_t i = 4; i-- > 0;) schema = schema << 8 | static_cast<unsigned char>(bytes[kMagic.size() + i]);
  return schema;
}

uint64_t Zigzag(int64_t value) { return static_cast<uint64_t>(value) << 1 ^ static_cast<uint64_t>(value >> 63); }
int64_t Unzigzag(uint64_t value) { return static_cast<int64_t>(value >> 1) ^ -static_cast<int64_t>(value & 1); }

size_t SharedSize(Text a, Text b) {
  const size_t most = std::min(a.size(), b.size());
  return static_cast<size_t>(std::mismatch(a.begin(), a.begin() + static_cast<ptrdiff_t>(most), b.begin()).first -
                             a.begin());
}

// The words of a list; false where it is no list.
template <class Function>
bool ReadList(Text list, size_t word_count, std::span<const Uses> uses, Function&& fn) {
  ByteReader reader(list);
  uint64_t word = 0;
  while (reader.left() != 0) {
    const uint64_t number = reader.Number();
    word += number >> kUsesBits;
    uint64_t which = number & kOtherUses;
    if (which == kOtherUses) which = reader.Number();
    if (reader.failed() || word >= word_count || which >= uses.size()) return false;
    fn(static_cast<uint32_t>(word++), uses[which]);
  }
  return true;
}

}  // namespace

void NameIndex::ForEachWordOf(size_t file, const std::function<void(uint32_t word, Uses uses)>& fn) const {
  static_cast<void>(ReadList(lists_[file], words_.size(), uses_, fn));
}

// ---- reading ----

NameIndex::State NameIndex::StateOf(Text bytes) {
  if (!bytes.starts_with(kMagic)) return kMagic.starts_with(bytes) ? State::kDamaged : State::kForeign;
  if (bytes.size() < kHeaderSize) return State::kDamaged;
  if (SchemaOf(bytes) != kSchema) return State::kOtherSchema;
  ByteReader checksum(bytes.substr(kChecksumAt, 8));
  return checksum.Fixed() == HashOfBytes(bytes.substr(kHeaderSize)) ? State::kFine : State::kDamaged;
}

NameIndex::NameIndex(Text bytes) {
  if (StateOf(bytes) != State::kFine || !Read(bytes.substr(kHeaderSize)) || !ReadLists())
    ThrowError(ErrorKind::kValueError, "the index is damaged");
}

bool NameIndex::Read(Text bytes) {
  ByteReader reader(bytes);
  settings_ = reader.String();

  const uint64_t word_count = reader.NumberUpTo(reader.left());
  for (uint64_t i = 0; i < word_count && !reader.failed(); ++i) words_.push_back({reader.String(), 0});

  const uint64_t uses_count = reader.NumberUpTo(reader.left());
  for (uint64_t i = 0; i < uses_count && !reader.failed(); ++i)
    uses_.push_back(static_cast<Uses>(reader.NumberUpTo(UINT32_MAX)));

  const uint64_t file_count = reader.NumberUpTo(reader.left());
  std::string path;
  for (uint64_t i = 0; i < file_count && !reader.failed(); ++i) {
    IndexedFile& file = files_.emplace_back();
    path.resize(reader.NumberUpTo(path.size()));
    path += reader.String();
    // In order and each once, as questions ask for them.
    if (i != 0 && path <= files_[i - 1].path) return false;
    file.path = path;
    file.size = reader.Number();
    file.time = Unzigzag(reader.Number());
    file.hash = reader.Fixed();
    file.lines = static_cast<uint32_t>(reader.NumberUpTo(UINT32_MAX));
    file.records = static_cast<uint32_t>(reader.NumberUpTo(UINT32_MAX));
    file.errors = static_cast<uint32_t>(reader.NumberUpTo(UINT32_MAX));
    file.problem = reader.String();
    lists_.push_back(reader.String());
  }
  return !reader.failed() && reader.left() == 0;
}

bool NameIndex::ReadLists() {
  return std::all_of(lists_.begin(), lists_.end(), [this](Text list) {
    return ReadList(list, words_.size(), uses_, [this](uint32_t word, Uses uses) { words_[word].uses |= uses; });
  });
}

std::vector<uint32_t> NameIndex::FilesFor(const WordNeeds& needs) const {
  // For each word the parts that it fits, but for the uses, which are a file's.
  constexpr size_t kMostParts = 32;
  struct Part {
    const WordPart* part;
    uint32_t bit;
  };
  std::vector<std::vector<Part>> alternatives;
  std::vector<uint32_t> wanted;
  size_t part_count = 0;
  for (const std::vector<WordPart>& parts : needs) {
    std::vector<Part>& alternative = alternatives.emplace_back();
    wanted.push_back(0);
    for (const WordPart& part : parts) {
      // More of them would only narrow the answer down.
      if (part_count == kMostParts) break;
      alternative.push_back({&part, uint32_t{1} << part_count++});
      wanted.back() |= alternative.back().bit;
    }
  }
  std::vector<uint32_t> fits(words_.size(), 0);
  std::vector<Uses> uses_of_bit(kMostParts, 0);
  for (const std::vector<Part>& alternative : alternatives) {
    for (const auto& [part, bit] : alternative) {
      uses_of_bit[static_cast<size_t>(std::countr_zero(bit))] = part->uses;
      for (size_t word = 0; word < words_.size(); ++word) {
        if (part->Fits(words_[word].word, words_[word].uses)) fits[word] |= bit;
      }
    }
  }

  std::vector<uint32_t> found;
  for (uint32_t file = 0; file < files_.size(); ++file) {
    // A file that could not be analysed has no answer as long as it is the same one.
    if (!files_[file].problem.empty()) continue;
    uint32_t held = 0;
    static_cast<void>(ReadList(lists_[file], words_.size(), uses_, [&](uint32_t word, Uses uses) {
      for (uint32_t bits = fits[word] & ~held; bits != 0; bits &= bits - 1) {
        const Uses asked = uses_of_bit[static_cast<size_t>(std::countr_zero(bits))];
        if (asked == 0 || (asked & uses) != 0) held |= bits & (~bits + 1);
      }
    }));
    if (std::any_of(wanted.begin(), wanted.end(), [&](uint32_t bits) { return (held & bits) == bits; }))
      found.push_back(file);
  }
  return found;
}

// ---- writing ----

std::optional<uint32_t> NameIndexWriter::Add(IndexedFile file, Text words) {
  FileWords read;
  if (file.problem.empty() && !ReadFileWords(words, read)) return std::nullopt;
  File& added = files_.emplace_back();
  added.file = std::move(file);
  added.file.hash = read.hash;
  added.file.records = read.records;
  added.words.reserve(read.words.size());
  for (const auto& [word, uses] : read.words) added.words.push_back({words_.NumberOfCopy(word), uses});
  return read.records;
}

void NameIndexWriter::Keep(const NameIndex& index, size_t number, uint64_t size, int64_t time) {
  if (kept_from_ != &index) {
    kept_from_ = &index;
    kept_numbers_.assign(index.words().size(), 0);
  }
  File& kept = files_.emplace_back();
  kept.file = index[number];
  kept.file.size = size;
  kept.file.time = time;
  index.ForEachWordOf(number, [&](uint32_t word, Uses uses) {
    uint32_t& known = kept_numbers_[word];
    if (known == 0) known = words_.NumberOfCopy(index.words()[word].word) + 1;
    kept.words.push_back({known - 1, uses});
  });
}

std::string NameIndexWriter::Finish(Text settings) {
  std::stable_sort(files_.begin(), files_.end(),
                   [](const File& a, const File& b) { return a.file.path < b.file.path; });
  files_.erase(std::unique(files_.begin(), files_.end(),
                           [](const File& a, const File& b) { return a.file.path == b.file.path; }),
               files_.end());

  // Numbers by the number of files, then by the first of them: so words that no other file has stand one
  // behind the other; then by their bytes, so that the same files give the same index whatever runs made it.
  const size_t all = words_.entries().size();
  std::vector<uint32_t> file_counts(all, 0);
  std::vector<uint32_t> order;
  order.reserve(all);
  std::vector<std::pair<Uses, uint32_t>> uses;
  std::vector<uint32_t> first_files(all, 0);
  for (uint32_t file = 0; file < files_.size(); ++file) {
    for (const Occurrence& word : files_[file].words) {
      if (file_counts[word.word]++ != 0) continue;
      first_files[word.word] = file;
      order.push_back(word.word);
    }
  }
  std::sort(order.begin(), order.end(), [&](uint32_t a, uint32_t b) {
    if (file_counts[a] != file_counts[b]) return file_counts[a] > file_counts[b];
    if (first_files[a] != first_files[b]) return first_files[a] < first_files[b];
    return words_[a].word < words_[b].word;
  });
  std::vector<uint32_t> numbers(all, 0);
  for (uint32_t i = 0; i < order.size(); ++i) numbers[order[i]] = i;

  std::unordered_map<Uses, uint32_t> uses_numbers;
  for (const File& file : files_) {
    for (const Occurrence& word : file.words) {
      const auto [found, is_new] = uses_numbers.try_emplace(word.uses, static_cast<uint32_t>(uses.size()));
      if (is_new) uses.emplace_back(word.uses, 0);
      ++uses[found->second].second;
    }
  }
  std::stable_sort(uses.begin(), uses.end(), [](const auto& a, const auto& b) {
    return a.second != b.second ? a.second > b.second : a.first < b.first;
  });
  for (uint32_t i = 0; i < uses.size(); ++i) uses_numbers[uses[i].first] = i;

  std::string body;
  AppendText(settings, body);
  AppendNumber(order.size(), body);
  for (const uint32_t word : order) AppendText(words_[word].word, body);
  AppendNumber(uses.size(), body);
  for (const auto& [bits, count] : uses) AppendNumber(bits, body);
  AppendNumber(files_.size(), body);
  Text before;
  std::string list;
  for (File& entry : files_) {
    const IndexedFile& file = entry.file;
    const size_t shared = SharedSize(before, file.path);
    AppendNumber(shared, body);
    AppendText(Text(file.path).substr(shared), body);
    before = file.path;
    AppendNumber(file.size, body);
    AppendNumber(Zigzag(file.time), body);
    AppendFixed(file.hash, body);
    AppendNumber(file.lines, body);
    AppendNumber(file.records, body);
    AppendNumber(file.errors, body);
    AppendText(file.problem, body);

    for (Occurrence& word : entry.words) word.word = numbers[word.word];
    std::sort(entry.words.begin(), entry.words.end(),
              [](const Occurrence& a, const Occurrence& b) { return a.word < b.word; });
    list.clear();
    uint64_t next = 0;
    for (const Occurrence& word : entry.words) {
      const uint64_t which = uses_numbers[word.uses];
      AppendNumber((word.word - next) << kUsesBits | std::min(which, kOtherUses), list);
      if (which >= kOtherUses) AppendNumber(which, list);
      next = uint64_t{word.word} + 1;
    }
    AppendText(list, body);
  }

  std::string bytes(kMagic);
  for (unsigned i = 0; i < 4; ++i) bytes += static_cast<char>(NameIndex::kSchema >> (8 * i));
  AppendFixed(HashOfBytes(body), bytes);
  bytes += body;
  return bytes;
}

}  // namespace quillet
