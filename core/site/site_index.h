// What the pages of a site know of each other: where names are defined, and where they occur.
//
// Two rounds over the files. In the first a writer says of each file what other files may mean, and SiteIndex
// takes that file by file, in order, so that the site is the same at any number of threads. Definitions stay
// in memory. Occurrences are many: they gather in buckets by name, which the caller spills to a disk and
// gives back, a group of buckets at a time, to become the scripts of the site. Then the index stands still,
// and pages are written by many threads in the second round.
#pragma once

#include <array>
#include <cstdint>
#include <memory>
#include <string>
#include <unordered_map>
#include <unordered_set>
#include <vector>

#include "analysis/batch.h"
#include "foundations/arena.h"
#include "site/occurrences.h"

namespace quillet {

// Writes what SiteIndex::Add takes.
std::unique_ptr<FileWriter> MakeSiteSurveyWriter(Version version);

class SiteIndex {
 public:
  static constexpr uint32_t kNone = UINT32_MAX;
  static constexpr size_t kBuckets = 1024;
  // As many places of a name in one role are listed; the others are counted.
  static constexpr uint32_t kMostPlaces = 500;

  // What a page's link needs of a name.
  struct Name {
    Text text;
    // Its definitions of any kind, and its classes, functions and type aliases alone.
    uint32_t definitions = 0;
    uint32_t opened = 0;
    uint32_t file = kNone;  // of the first one; one that opens something stands before the others
    uint32_t line = 0;      // from 0
    // Its places by role, and behind those the parameters of this name.
    std::array<uint32_t, kNameRoleCount + 1> counts{};
    // Of the list of its definitions, in their order; kNone without any.
    uint32_t first_definition = kNone;
    uint32_t last_definition = kNone;
  };

  // The names of all files by their numbers, such as "src/shop.py", and the names of the attributes that values
  // of the language's own types have.
  SiteIndex(const std::vector<std::string>& files, const std::vector<std::string>& builtin_attributes);

  // ---- the first round ----

  // Takes what a survey wrote of the file with this number. Throws for anything else.
  void Add(uint32_t file, Text survey);
  // The bytes that wait for a spill.
  size_t waiting_bytes() const { return waiting_bytes_; }
  // Takes what waits of a bucket.
  std::string TakeBucket(size_t bucket);

  // ---- behind it ----

  // How many scripts hold the places of names: that of a name is its number modulo this.
  size_t ScriptCount() const;
  // The script of a group, out of all bytes of its buckets (those whose number modulo ScriptCount() is that of
  // the group), those of one bucket in their order.
  std::string PlacesScript(Text buckets) const;
  // The script of all definitions.
  std::string DefinitionsScript() const;
  // The number of a name; kNone for one that the first round did not see. For any thread.
  uint32_t Find(Text name) const;
  const Name& name(uint32_t number) const { return names_[number]; }
  size_t definition_count() const { return definitions_.size(); }
  // Where a link to a name leads that is defined elsewhere: the one definition, null where there is none or
  // several. A definition of another module than `module`, which is empty where it is not known, is not meant.
  // An attribute that values of the language's own types have may be one of those.
  const Name* OnlyDefinition(uint32_t number, Text module, bool is_attribute) const;
  // The file of a module, by its path or the end of it, such as "shop.items"; kNone where none or several are
  // called that.
  uint32_t FileOfModule(Text dotted) const;

 private:
  struct Module {
    uint32_t file;
    bool is_whole;  // all of the file's path, not its end alone
  };
  struct Definition {
    uint32_t scope;  // index in scope_texts_
    uint32_t file;
    uint32_t line;  // from 0
    uint32_t next;  // of the same name; kNone behind the last one
    uint8_t kind;   // a NameKind, or behind them an attribute
  };

  template <class Function>
  void ForEachDefinition(const Name& name, Function&& function) const {
    for (uint32_t i = name.first_definition; i != kNone; i = definitions_[i].next) function(definitions_[i]);
  }
  void AppendScopes(const Name& name, std::string& out) const;
  uint32_t NumberOf(Text name);
  uint32_t NumberOfScope(Text scope);

  void AddModule(uint32_t file);
  bool IsOfModule(uint32_t file, Text module) const;

  std::vector<std::string> files_;
  std::unordered_map<Text, Module> modules_;  // by path and by each of its ends, with slashes
  std::unordered_set<std::string> builtin_attributes_;
  std::vector<Name> names_;
  std::unordered_map<Text, uint32_t> name_index_;
  std::vector<Text> scope_texts_;
  std::unordered_map<Text, uint32_t> scope_index_;
  std::vector<Definition> definitions_;
  std::array<std::string, kBuckets> buckets_;
  size_t waiting_bytes_ = 0;
  size_t place_count_ = 0;
  TextArena texts_;
};

}  // namespace quillet
