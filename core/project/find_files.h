// Which files of some folders are Python source, by their names, the ignore rules around them, and their first lines.
//
// A folder gives its .py, .pyi and .pyw files and those whose first line names Python as interpreter, in order of their
// names, the files of a folder before those of its subfolders. .gitignore files count where git would read them: in the
// folder, in those below it and in those above it up to the root of the repository; the one nearest to a file decides.
// A file that is named is taken whatever excludes it. The repository's own folder .git is never entered, and neither is
// a virtual environment (a file pyvenv.cfg tells) that is no argument and that no rule takes in.
// The trap: a folder may hold anything. Only regular files are opened. A link to a folder is not followed, a link to a
// file counts where the file lies below an argument and was not met by its own name, and one that leads nowhere that
// can be told is named, as is whatever else cannot be looked at.
#pragma once

#include <cstdint>
#include <functional>
#include <string>
#include <vector>

#include "foundations/text.h"

namespace quillet {

struct FoundFile {
  std::string path;     // from its argument on, as that was given
  std::string problem;  // why it cannot be read; empty where nothing speaks against it
  uint32_t argument;    // that it comes from
  uint32_t below;       // where in the path begins what stands below the argument; 0 for the argument itself
  uint64_t size = 0;    // both of files below a folder
  int64_t time = 0;
};

// What a walk takes and leaves out.
struct WalkRules {
  bool gitignore = true;
  // Lines of a .gitignore file for each folder that is an argument; they overrule others.
  Text exclude = {};
  // As the parts of a program: .py and .pyi files alone, no hidden folders, and of no file size or time.
  bool is_program = false;
  // Called with each folder and each file of rules in front of its reading, whether it is there or not: what else may
  // be found later shows there.
  std::function<void(const std::string& path)> watch = {};
};

// The files of the arguments, in their order; links to files come last. "-" passes as it is, as does an argument that
// is no folder. May be stopped (stop.h).
std::vector<FoundFile> FindFiles(const std::vector<std::string>& arguments, const WalkRules& rules);

}  // namespace quillet
