// The index of a repository: which files hold which words, in what uses. docs/index.md describes its bytes.
//
// Files lie in the order of their paths, each with the numbers of its words and their uses, so a question
// looks once through all of it, which takes a few ns a word of a file. Words are numbered by how many
// files have them, most first, which makes the steps from number to number small.
// An index may come from anybody. It is looked through when it is opened, so that nothing behind that
// can read past its end, and nothing of it is taken for true but which files may be worth an analysis.
#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <span>
#include <string>
#include <vector>

#include "index/question.h"
#include "index/words.h"

namespace quillet {

// What an index knows of a file. Texts are views.
struct IndexedFile {
  std::string path;
  uint64_t size = 0;
  int64_t time = 0;   // of its last change
  uint64_t hash = 0;  // of the source
  uint32_t lines = 0;
  uint32_t records = 0;
  uint32_t errors = 0;
  std::string problem;  // why it could not be analysed; empty where it was
};

class NameIndex {
 public:
  static constexpr uint32_t kSchema = 2;

  enum class State : uint8_t { kFine, kForeign, kOtherSchema, kDamaged };
  // What some bytes are.
  static State StateOf(Text bytes);

  // The bytes must stay where they are. Throws ValueError unless their state is kFine.
  explicit NameIndex(Text bytes);

  // What the writer was given besides.
  Text settings() const { return settings_; }
  size_t size() const { return files_.size(); }
  const IndexedFile& operator[](size_t file) const { return files_[file]; }
  std::span<const WordTable::Entry> words() const { return words_; }

  // The files that may answer, in their order.
  std::vector<uint32_t> FilesFor(const WordNeeds& needs) const;

  // Calls `fn(word, uses)` for each word of a file, `word` its number in words().
  void ForEachWordOf(size_t file, const std::function<void(uint32_t word, Uses uses)>& fn) const;

 private:
  friend class NameIndexWriter;

  bool Read(Text bytes);
  bool ReadLists();

  Text settings_;
  std::vector<IndexedFile> files_;
  std::vector<Text> lists_;              // of files_
  std::vector<WordTable::Entry> words_;  // with the uses in all files
  std::vector<Uses> uses_;               // that lists_ number
};

// Makes the bytes of an index from files in any order.
class NameIndexWriter {
 public:
  // A file that was analysed, whose records it counts; nothing where `words` is not what a words writer
  // wrote. A file with a problem has none.
  std::optional<uint32_t> Add(IndexedFile file, Text words);
  // A file as an index knows it, with another size and time.
  void Keep(const NameIndex& index, size_t number, uint64_t size, int64_t time);
  // Of several files with one path the first one counts.
  std::string Finish(Text settings);

 private:
  struct Occurrence {
    uint32_t word;
    Uses uses;
  };
  struct File {
    IndexedFile file;
    std::vector<Occurrence> words;
  };

  std::vector<File> files_;
  WordTable words_;
  const NameIndex* kept_from_ = nullptr;
  std::vector<uint32_t> kept_numbers_;  // by the number in kept_from_, + 1
};

}  // namespace quillet
