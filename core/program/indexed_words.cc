// An index keeps its settings as texts between NULs: the version, whether ignored files count, what made it, and more.
#include "program/indexed_words.h"

#include <algorithm>
#include <charconv>
#include <utility>

#include "foundations/errors.h"
#include "foundations/file_status.h"

namespace quillet {

namespace {

constexpr Text kNameOfIndex = ".quillet-index";
// One of a hundred million lines is smaller.
constexpr size_t kLargestIndex = size_t{128} << 20;
// What DefinedNames takes for definitions is a definition or a write.
constexpr Uses kDefiningUses = UseOfRole(NameRole::kDefinition) | UseOfRole(NameRole::kWrite) | kDefineUse;

// The next of the texts between NULs.
Text NextPart(Text& rest) {
  const size_t end = std::min(rest.find('\0'), rest.size());
  const Text part = rest.substr(0, end);
  rest.remove_prefix(std::min(end + 1, rest.size()));
  return part;
}

Version WrittenVersion(Text text) {
  const size_t dot = std::min(text.find('.'), text.size());
  int major = 0, minor = 0;
  std::from_chars(text.data(), text.data() + dot, major);
  if (dot < text.size()) std::from_chars(text.data() + dot + 1, text.data() + text.size(), minor);
  return Version::Of(major, minor);
}

}  // namespace

std::unique_ptr<IndexedWords> IndexedWords::Read(const std::string& folder, Text made_by) {
  const std::string path = Join(folder, kNameOfIndex);
  const std::optional<FileStatus> status = StatusOf(path, false);
  if (!status || !status->is_file || status->size > kLargestIndex) return nullptr;
  std::string bytes;
  if (ReadBeginning(path, false, status->size, bytes)) return nullptr;
  if (NameIndex::StateOf(bytes) != NameIndex::State::kFine) return nullptr;
  try {
    std::unique_ptr<IndexedWords> words(new IndexedWords(std::move(bytes), made_by));
    if (words->keys_.empty()) return nullptr;
    return words;
  } catch (const Error&) {  // damaged behind a checksum that fits
    return nullptr;
  }
}

IndexedWords::IndexedWords(std::string bytes, Text made_by) : bytes_(std::move(bytes)), index_(bytes_) {
  Text settings = index_.settings();
  version_ = WrittenVersion(NextPart(settings));
  NextPart(settings);
  if (NextPart(settings) != made_by) return;
  keys_.reserve(index_.words().size());
  for (const WordTable::Entry& entry : index_.words()) {
    if (HasWordKey(entry.word)) {
      keys_.push_back({KeyOfWord(entry.word), KeyOfDefinition(entry.word), true});
    } else {
      keys_.push_back({0, 0, false});
    }
  }
}

std::optional<uint32_t> IndexedWords::Find(Text path_below, const FileStamp& stamp) const {
  size_t first = 0, behind = index_.size();
  while (first < behind) {
    const size_t middle = first + (behind - first) / 2;
    if (Text(index_[middle].path) < path_below) {
      first = middle + 1;
    } else {
      behind = middle;
    }
  }
  if (first == index_.size() || index_[first].path != path_below) return std::nullopt;
  const IndexedFile& file = index_[first];
  if (!stamp.is_file() || stamp.size != file.size || stamp.modified != file.time) return std::nullopt;
  // What cannot be parsed is cut into other statements by who reads it for its names.
  if (!file.problem.empty() || file.errors != 0) return std::nullopt;
  return static_cast<uint32_t>(first);
}

void IndexedWords::KeysOf(uint32_t file, std::vector<WordKey>& keys) const {
  keys.clear();
  index_.ForEachWordOf(file, [&](uint32_t word, Uses uses) {
    const Keys& of_word = keys_[word];
    if (!of_word.is_word) return;
    keys.push_back(of_word.word);
    if ((uses & kDefiningUses) != 0) keys.push_back(of_word.definition);
  });
}

}  // namespace quillet
