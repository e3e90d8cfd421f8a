// The Python files below the roots of a project, and which of them hold a word.
//
// The first question about words searches all files; the second one makes a filter of each one's words, about a byte a
// word. Those behind it ask the filters, and read again what has changed. Where an index lies in a root, filters are
// made of what it says in front of the first question, which searches the files that the index does not know as they
// are.
#pragma once

#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "foundations/text.h"
#include "program/files.h"

namespace quillet {

class ProjectFiles {
 public:
  // `exclude` are lines of an ignore file for each root that is a folder; they overrule others. Indexes made by
  // `index_maker` are used; none where it is empty.
  explicit ProjectFiles(Files& files, std::vector<std::string> roots, Text exclude = Text(""),
                        Text index_maker = Text(""));
  ~ProjectFiles();

  // All files below the roots that FindFiles gives of a program, and open buffers there, in the order of their paths.
  // A root that is a file is one of them. Walked once, and again when Refresh, or the next question behind Forget,
  // finds that folders changed.
  const std::vector<FileId>& All();
  // Those in which all the words are names, in the order of their paths, and maybe more: those that hold them as whole
  // words anywhere. Nothing is analysed.
  std::vector<FileId> WithWords(const std::vector<Text>& words);
  // The same files one after the other, until `take` has enough and gives false: no more are searched. `take` asks
  // nothing of the project.
  void EachWithWord(Text word, const std::function<bool(FileId)>& take);
  // Those in which a name may be defined in the body of a class or as an attribute that is assigned: all in which it
  // is, and some more. By an import is not counted.
  std::vector<FileId> DefiningMember(Text name);
  // Those of them that hold another word, too, and those that do and have `__slots__`, of which the name may be one.
  std::vector<FileId> DefiningMember(Text name, Text word);

  // Looks whether files came or went; true where any did. What the files hold is looked at by the next question about
  // words. Costs a look at each folder.
  bool Refresh();
  // The next question does so; for when buffers were opened or closed.
  void Forget();

  // Of the filters.
  size_t ByteSize() const;
  // How many sources were searched, or read for their filters, until now.
  size_t read_count() const;

 private:
  class Impl;
  std::unique_ptr<Impl> impl_;
};

}  // namespace quillet
