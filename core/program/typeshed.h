// The stubs of the standard library: which of its modules a version has, from the file VERSIONS beside them.
#pragma once

#include <string>
#include <unordered_map>
#include <vector>

#include "foundations/text.h"

namespace quillet {

class Typeshed {
 public:
  // `folder` holds VERSIONS, or a folder `stdlib` that does; empty without stubs.
  Typeshed(const std::string& folder, Version version);

  // Where the stubs lie; empty without any.
  const std::string& folder() const { return folder_; }

  // Whether the version has a module, by its dotted name: a submodule that is not listed lives as long as its package.
  // To Python 2, of which the stubs know nothing, belongs what is as old as 3.0.
  bool Has(Text module) const;
  // The name under which the stubs have a module of Python 2 that was renamed since; the name itself for any other.
  Text NameOf(Text module) const;
  // The listed modules that the version has, without submodules.
  std::vector<std::string> TopNames() const;

 private:
  struct Range {
    int first = 0;  // 100 * major + minor
    int last = 0;
    bool Holds(int version) const { return first <= version && version <= last; }
  };

  void Read(Text line);

  std::string folder_;
  bool is_python2_;
  int version_;
  std::unordered_map<std::string, Range> ranges_;
};

}  // namespace quillet
