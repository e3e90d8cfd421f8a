// Modules: which file an import names, without running anything.
//
// A name is looked for in the order of the language: the roots of the project, then the folders of the
// environment's library. For each module there may be a stub: beside it, in a folder of stubs, in `name-stubs`, or
// typeshed's for the standard library, of the version asked for.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "foundations/text.h"
#include "program/files.h"

namespace quillet {

using ModuleId = uint32_t;
inline constexpr ModuleId kNoModule = UINT32_MAX;

struct Module {
  std::string name;                  // dotted
  FileId file = kNoFile;             // its source; kNoFile for a namespace package, and where only a stub is known
  FileId stub = kNoFile;             // its stub
  std::vector<std::string> folders;  // where its submodules lie; none for what is no package
  bool is_package = false;           // regular or namespace
  bool is_project = false;           // lies below a root of the project
};

class Modules {
 public:
  struct Settings {
    std::vector<std::string> roots;      // folders in which the project's top-level modules lie
    std::vector<std::string> libraries;  // the environment's: standard library, site-packages, those of *.pth
    std::string typeshed;                // folder of typeshed's `stdlib` with its VERSIONS; empty without
  };

  Modules(Files& files, Settings settings);
  ~Modules();

  const Module& operator[](ModuleId module) const;

  // The module of a dotted absolute name; kNoModule where there is none. Remembered until Forget.
  ModuleId Find(Text name);
  // What an import statement of a file names: `level` dots and a dotted name, which may be empty. Looks in the
  // importing file's own folder where nothing else has it; first, where the file is Python 2 without
  // absolute imports.
  ModuleId FindFrom(FileId importer, int level, Text name);
  // A submodule; kNoModule where there is none.
  ModuleId Child(ModuleId package, Text name);
  // The module that a file is: by the roots and libraries, and for any other by its base name.
  ModuleId OfFile(FileId file);
  // The names of submodules, or of top-level modules for kNoModule: sorted, each once.
  std::vector<std::string> ChildNames(ModuleId package);

  // Looks whether modules came or went in the folders that were looked into; forgets all where any did, and says so.
  bool Refresh();
  // After buffers were opened or closed.
  void Forget();

 private:
  class Impl;
  std::unique_ptr<Impl> impl_;
};

// What a path of a virtual environment or an interpreter says about where its library lies and which version it
// is: from pyvenv.cfg, the layout of folders and *.pth files. Nothing is run.
struct Environment {
  std::vector<std::string> libraries;
  Version version;  // count 0 where it is not known
};
Environment FindEnvironment(const std::string& path);

// The folders in which a project's top-level modules lie: the folder itself and, for a `src` layout, `src`.
std::vector<std::string> SourceRootsOf(const std::string& folder);

}  // namespace quillet
