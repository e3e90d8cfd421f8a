// What the index of a folder (index/name_index.h) says of the words of its files, as keys of filters: so that the
// first question about words need not read a project whose words were found before.
//
// An index only says which files are worth a look, and only of those whose size and time are as it knows them. It may
// have come from anybody: no path of it is opened, it is only compared with those of files that a walk has found.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "foundations/text.h"
#include "index/name_index.h"
#include "project/file_system.h"
#include "project/word_filters.h"

namespace quillet {

class IndexedWords {
 public:
  // What the index that lies in a folder says; nullptr where there is none, or one that is a link, damaged, of another
  // schema, or was made by anything but `made_by`.
  static std::unique_ptr<IndexedWords> Read(const std::string& folder, Text made_by);

  // The language that the files were read as: two numbers.
  const Version& version() const { return version_; }
  // The file of a path below the folder, with the stamp that it has; nothing where the index says nothing of it.
  std::optional<uint32_t> Find(Text path_below, const FileStamp& stamp) const;
  // Its words and the names that it may define, as WordKeys has them, but for what only strings and comments hold, and
  // words of kLongestWord bytes and more. `keys` is cleared first. For any number of threads.
  void KeysOf(uint32_t file, std::vector<WordKey>& keys) const;

  static constexpr size_t kLongestWord = kMaxWordSize;

 private:
  struct Keys {
    WordKey word;
    WordKey definition;
    bool is_word;  // otherwise there are none
  };

  IndexedWords(std::string bytes, Text made_by);

  const std::string bytes_;
  const NameIndex index_;
  Version version_;
  std::vector<Keys> keys_;  // by the numbers of words
};

}  // namespace quillet
