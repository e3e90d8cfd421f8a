// The Python files below the roots of a project, and which of them hold a word.
#pragma once

#include <memory>
#include <string>
#include <vector>

#include "foundations/text.h"
#include "workspace/files.h"

namespace quillet {

class ProjectFiles {
 public:
  ProjectFiles(Files& files, std::vector<std::string> roots);
  ~ProjectFiles();

  // All *.py and *.pyi files below the roots and open buffers there, in the order of their paths; what .gitignore
  // leaves out is not there, nor are hidden folders, `__pycache__`, `node_modules` and virtual environments. A root
  // that is a file is one of them. Links to folders are not followed, and those to files where these lie below a
  // root. Walked once and again after Forget.
  const std::vector<FileId>& All();
  // Those in which all the words occur as whole words, in the order of their paths. Bytes are searched by threads,
  // nothing is analysed.
  std::vector<FileId> WithWords(const std::vector<Text>& words);

  void Forget();

 private:
  class Impl;
  std::unique_ptr<Impl> impl_;
};

}  // namespace quillet
