// Under which names a file knows what its type checker's module gives it.
//
// The strings in a call of `cast` or in a subscript mean types or do not, by what the name in front is; and
// what a name is, the imports of the file say. They are read wherever they stand, without scopes: a name that
// some import makes the module's is the module's.
#pragma once

#include <span>
#include <string>
#include <unordered_map>
#include <unordered_set>

#include "foundations/text.h"
#include "lines/cutter.h"
#include "lines/source_text.h"

namespace quillet {

class TypingNames {
 public:
  // Reads those rows of a source that are imports.
  void Read(const SourceText& source, std::span<const LineRow> rows, std::span<const uint32_t> imports);

  // What the module calls that which stands here under `name`; empty where it is none of its names.
  Text MemberOf(Text name) const;
  bool IsModule(Text name) const { return modules_.contains(name); }
  // Whether a call of `cast` may stand under another name.
  bool has_renamed_cast() const { return has_renamed_cast_; }

 private:
  void ReadImport(TokenSpan toks);
  void ReadFromImport(TokenSpan toks);

  std::unordered_map<Text, Text> members_;  // views of the source
  std::unordered_set<Text> modules_;
  bool has_star_ = false;
  bool has_renamed_cast_ = false;
};

}  // namespace quillet
