// The words of names, and what a file does with each of them: what an index keeps of a file.
//
// A word is a run of letters, digits, underscores and bytes of 0x80 and above, such as `os`, `path` and
// `join` of `os.path.join`; a name without any, such as `*`, is a word itself. What a record or an occurrence
// says of its name is kept with the last word, and for the others only that they occur. So a question for a name can
// concern only the files that hold all words of it, the last one in a use that is asked for.
// The trap: names are views of each other (a, a.b, a.b.c), so to look each of them through from its start
// would take the square of a long one.
#pragma once

#include <algorithm>
#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "analysis/batch.h"
#include "foundations/arena.h"
#include "foundations/utf8.h"
#include "names/binder.h"

namespace quillet {

// In what ways a file uses a word, a bit each: the kinds of records, of which a set parameter is one of its
// own, and that a scope has the name.
using Uses = uint32_t;

constexpr Uses UseOfKind(RecordKind kind) { return Uses{1} << static_cast<unsigned>(kind); }
inline constexpr Uses kParameterUse = Uses{1} << 16;
inline constexpr Uses kScopeUse = Uses{1} << 17;
// What occurrences of a name do: a bit a role, where a definition is that of a variable unless it has a bit of
// its own; and where they stand.
constexpr Uses UseOfRole(NameRole role) { return Uses{1} << (18 + static_cast<unsigned>(role)); }
inline constexpr Uses kDecoratorUse = Uses{1} << 26;
inline constexpr Uses kBaseUse = Uses{1} << 27;
inline constexpr Uses kAnnotationUse = Uses{1} << 28;
inline constexpr Uses kRaiseUse = Uses{1} << 29;
inline constexpr Uses kDefineUse = Uses{1} << 30;  // a class, a function or a type alias
inline constexpr Uses kAllUses = ~kScopeUse;

inline Uses UseOf(const PlacedRecord& record) {
  return record.is_parameter && record.kind == RecordKind::kSet ? kParameterUse : UseOfKind(record.kind);
}

// All uses that an occurrence is.
Uses UsesOf(const Occurrence& occurrence, const Bindings& bindings, const SourceText& source);

// A longer word is cut to its beginning.
inline constexpr size_t kMaxWordSize = 100;

inline bool IsWordByte(char byte) {
  return (AsciiClassOf(byte) & (kAsciiAlpha | kAsciiDigit | kAsciiUnderscore)) != 0 ||
         static_cast<unsigned char>(byte) >= 0x80;
}

// Calls `fn(word, begin, is_last)` for the words of a name that end behind `from`.
template <class Function>
void ForEachWord(Text name, size_t from, Function&& fn) {
  size_t at = from;
  while (at > 0 && IsWordByte(name[at - 1])) --at;
  Text found;
  while (at < name.size()) {
    while (at < name.size() && !IsWordByte(name[at])) ++at;
    const size_t begin = at;
    while (at < name.size() && IsWordByte(name[at])) ++at;
    if (begin == at) break;
    if (found.data() != nullptr) fn(found, false);
    found = name.substr(begin, std::min(at - begin, kMaxWordSize));
  }
  if (found.data() == nullptr && from == 0) found = name.substr(0, kMaxWordSize);
  if (found.data() != nullptr) fn(found, true);
}

// A hash of any bytes that two texts which differ in eight bytes at most never share.
uint64_t HashOfBytes(Text bytes);

// Numbers words in the order in which they come, and holds a value for each. The words are views unless
// they are kept.
class WordTable {
 public:
  struct Entry {
    Text word;
    Uses uses;
  };

  void Clear();
  // The number of a word, which is added where it is new.
  uint32_t NumberOf(Text word);
  // The same for a word that may go: the table takes a copy of a new one.
  uint32_t NumberOfCopy(Text word);

  Entry& operator[](size_t number) { return entries_[number]; }
  const std::vector<Entry>& entries() const { return entries_; }

 private:
  void Grow();

  std::vector<Entry> entries_;
  std::vector<uint64_t> hashes_;
  std::vector<uint32_t> slots_;  // number + 1; 0 where it is free
  TextArena texts_;
};

// A file's words as a writer hands them on.
struct FileWords {
  uint64_t hash = 0;     // of the source
  uint32_t records = 0;  // the number of records
  std::vector<WordTable::Entry> words;
};

// Writes the words of each file that is analysed.
std::unique_ptr<FileWriter> MakeWordsWriter(Version version);

// Reads what that wrote; the words are views of it. False where it is something else.
bool ReadFileWords(Text written, FileWords& words);

}  // namespace quillet
