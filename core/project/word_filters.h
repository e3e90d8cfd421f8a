// Which words a source may hold and which names it may define, in about a byte a word: a Bloom filter of its words,
// and of the names that stand where a definition begins. It may say yes where there is none, and never no where one is.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <utility>
#include <vector>

#include "foundations/text.h"

namespace quillet {

// What filters know a word, and a name that is defined, by.
using WordKey = uint64_t;
WordKey KeyOfWord(Text word);
WordKey KeyOfDefinition(Text name);
WordKey KeyOfMember(Text name);  // of a class

// Whether keys tell of a word at all: a run of letters, digits and underscores that begins with no digit.
bool HasWordKey(Text word);

// The distinct keys of one source after another, in memory that is kept.
//
// A word is what FindWord finds, in strings and comments too. Defined are the names behind `def`, `class` and `as`,
// those in front of `=`, `:` and augmented assignments, the other targets of an assignment, and those of `for`
// statements; behind a dot or not. More than that may be said to be defined, as nothing is analysed; parameters, what
// comprehensions and patterns bind, and what imports bind without `as` need not be.
class WordKeys {
 public:
  // The bytes of `source` stay what they are; behind them there must be room to write.
  void Read(std::string& source);

  const std::vector<WordKey>& keys() const { return keys_; }
  // Of the defined names that stand behind a dot, as members; some more than once.
  const std::vector<WordKey>& attributes() const { return attributes_; }
  // Whether the source may define what its keys do not say: its targets go on without end.
  bool may_define_any() const { return may_define_any_; }

 private:
  void Clear(size_t size);
  void Grow();
  void Add(WordKey key);
  void ReadBlocks();
  void AddWord(size_t begin, size_t end);
  void AddDefinition(size_t begin, size_t end, bool is_annotated = false);
  size_t BeginOfWord(size_t end) const;
  size_t EndOfWord(size_t begin) const;
  bool IsBehindDot(size_t at) const;
  bool BeginsStatement(size_t at) const;
  bool EndsStatement(size_t line_end) const;
  void ReadMark(size_t at);
  void ReadTargetsBefore(size_t end);
  bool FindTargetsBefore(size_t end);
  void ReadNameBehind(size_t at);
  void ReadAlias(size_t at);
  void ReadLoopTargets(size_t keyword, size_t at);
  bool Spend(size_t bytes);

  const char* text_ = nullptr;  // the source, and kSpare bytes that are zero
  size_t size_ = 0;
  size_t budget_ = 0;  // bytes that may be looked at twice
  bool may_define_any_ = false;
  std::vector<WordKey> keys_;
  std::vector<WordKey> attributes_;
  std::vector<WordKey> slots_;  // the same, open addressing; 0 for none
  size_t slot_mask_ = 0;
  std::vector<std::pair<size_t, size_t>> targets_;  // where they begin and end
};

// Appends the filter of some keys.
void AppendFilter(const std::vector<WordKey>& keys, std::vector<uint64_t>& bits);
// Whether a filter of `size` numbers at `bits` may hold a key; one of none holds nothing.
bool MayHold(const uint64_t* bits, size_t size, WordKey key);

}  // namespace quillet
