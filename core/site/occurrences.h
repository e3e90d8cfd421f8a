// The names of a file as a site shows them: where each stands, what happens to it there, and whose it is.
//
// Input: a file's bindings. A variable of a function (or of a lambda, a comprehension) is known by its symbol
// alone, within the file. Names of modules and classes, attributes, keyword names and the paths of imports are
// *shared*: other files may mean them, and all that can be said of those without running the program is that
// they are spelled alike. A name that the file binds nowhere is the language's own, and is not shown as a name,
// unless a star import may have brought it.
// The trap is size: a source of one endless line has more names than a page can show, so only those in the
// shown part are collected.
#pragma once

#include <cstdint>
#include <span>
#include <string>
#include <unordered_map>
#include <unordered_set>
#include <vector>

#include "analysis/file_analyzer.h"
#include "analysis/placed_records.h"
#include "foundations/arena.h"
#include "names/binder.h"

namespace quillet {

inline constexpr size_t kNameRoleCount = static_cast<size_t>(NameRole::kDeclaration) + 1;

// The part of a source that a page shows: whole lines up to a limit, of each a limited part.
class ShownPart {
 public:
  static constexpr uint32_t kMostBytes = 4 << 20;
  static constexpr uint32_t kMostBytesOfLine = 10'000;

  explicit ShownPart(const SourceText& source);

  // The physical lines of the source, and those of them that are shown.
  uint32_t line_count() const { return line_count_; }
  uint32_t shown_lines() const { return shown_lines_; }
  // Whether lines are shown from end to end.
  bool shows_whole_lines() const { return shows_whole_lines_; }
  // The first byte of a line, the one behind its last (line ends left out), and where its shown part ends.
  uint32_t BeginOf(uint32_t line) const { return source_.line_starts[line]; }
  uint32_t EndOf(uint32_t line) const;
  uint32_t ShownEndOf(uint32_t line) const;
  // Whether a place of a line (both from 0) is shown.
  bool Shows(uint32_t line, uint32_t end) const { return line < shown_lines_ && end <= ShownEndOf(line); }

 private:
  const SourceText& source_;
  uint32_t line_count_ = 0;
  uint32_t shown_lines_ = 0;
  bool shows_whole_lines_ = true;
};

struct SiteOccurrence {
  uint32_t begin;     // of its bytes in the source
  uint32_t size;      // in bytes
  uint32_t line;      // from 0
  uint32_t variable;  // the symbol that owns it; kNoIndex for attributes, keyword names and paths
  uint32_t receiver;  // of an attribute, the variable in front of its dot; kNoIndex where that is no variable
  // The first binding of a variable is its definition, an import never is one.
  NameRole role;
  NameKind kind;  // of what is defined here
  bool is_attribute;
};

// A definition as a search lists it.
struct SiteDefinition {
  uint32_t occurrence;
  Text scope;  // dotted, of what it stands in
};

class SiteOccurrences {
 public:
  explicit SiteOccurrences(Version version) : binder_(version) {}

  // What it gives stands until the next call or the next file.
  void Collect(const FileAnalyzer& file, const ShownPart& shown);

  std::span<const SiteOccurrence> occurrences() const { return occurrences_; }  // in order of their places
  std::span<const SiteDefinition> definitions() const { return definitions_; }  // in order of their places

  // The occurrence that defines a variable; kNoIndex where none that is shown does.
  uint32_t DefinitionOf(uint32_t variable) const { return variables_[variable].definition; }
  // Whether what a variable stands for comes from another file.
  bool IsImported(uint32_t variable) const { return variables_[variable].is_imported; }
  // Whether other files may mean this occurrence's name.
  bool IsShared(const SiteOccurrence& occurrence) const {
    if (occurrence.variable == kNoIndex) return true;
    const Variable& variable = variables_[occurrence.variable];
    return variable.is_shared || variable.is_imported || IsParameter(occurrence);
  }
  static bool IsParameter(const SiteOccurrence& occurrence) {
    return occurrence.role == NameRole::kDefinition && occurrence.kind == NameKind::kParameter;
  }

 private:
  struct Variable {
    uint32_t binding = kNoIndex;     // the occurrence that defines it, among the bindings
    uint32_t definition = kNoIndex;  // the same among the occurrences that are shown
    bool is_shared = false;
    bool is_imported = false;
  };

  void FindVariables(const Bindings& bindings);
  void Add(const Bindings& bindings, uint32_t index, uint32_t line);
  void FindDefinitions(const Bindings& bindings);
  void AddDefinition(const Bindings& bindings, uint32_t occurrence, uint32_t scope);
  uint32_t ClassAround(const Bindings& bindings, uint32_t scope) const;
  Text DottedNameOf(const Bindings& bindings, uint32_t scope);

  NameBinder binder_;
  std::vector<SiteOccurrence> occurrences_;
  std::vector<uint32_t> scope_of_;  // by occurrence
  std::vector<uint32_t> text_of_;   // by occurrence; index among the bindings' texts
  std::vector<Variable> variables_;
  std::vector<SiteDefinition> definitions_;
  std::vector<Text> dotted_names_;           // by scope; none where it was not asked for
  std::unordered_set<uint64_t> attributes_;  // a class and a text: those that were seen
  std::vector<uint32_t> chain_;
  std::string buffer_;
  TextArena texts_;
};

// What records say of a name beyond its role: its hint, values that it is set to.
class SiteFacts {
 public:
  // What it gives stands until the next call or the next file.
  void Collect(const FileAnalyzer& file, const ScopeNames& scopes, PlacedRecords& placed, const ShownPart& shown);

  // What is said of the name that begins at this byte, such as ": int"; empty for most.
  Text At(uint32_t begin) const;
  // The module that the name there is imported from, as the statement spells it.
  Text ModuleAt(uint32_t begin) const;

 private:
  void Add(const PlacedRecord& record, uint32_t begin);

  // By first byte.
  std::unordered_map<uint32_t, std::string> facts_;
  std::unordered_map<uint32_t, std::string> modules_;
};

}  // namespace quillet
