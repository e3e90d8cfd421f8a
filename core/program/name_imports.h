// What a source may import under a name, told by its text alone: so that files in which a name cannot be the one that
// is asked about need not be read.
#pragma once

#include <optional>
#include <string>
#include <vector>

#include "foundations/text.h"

namespace quillet {

// A `from` import: `name` out of a module, which stands behind so many dots. Without a name all of the module's (`*`).
struct NameImport {
  int level = 0;
  std::string module;
  std::string name;
};

// All `from` imports that may bind the word or name it, in strings and comments too; nullopt where more may be meant by
// it: where it stands behind a dot, other than in the path of such an import, or where an import is hard to read. A
// word behind which nothing is imported is a name of the source's own, or of the language.
std::optional<std::vector<NameImport>> ImportsOfName(Text source, Text word);

}  // namespace quillet
