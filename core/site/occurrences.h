// The names of a file as a site shows them: where each stands, what happens to it there, and whose it is.
//
// A name that belongs to a function (or to a lambda, a comprehension) is known by its symbol alone, within the
// file. Names of modules and classes, and attributes, are *shared*: other files may mean them, and all that can
// be said of those without running the program is that they are spelled alike.
// The trap is size: a source of one endless line has more names than a page can show, so only those in the
// shown part are collected.
#pragma once

#include <cstdint>
#include <span>
#include <string>
#include <unordered_map>
#include <vector>

#include "analysis/file_analyzer.h"
#include "analysis/placed_records.h"
#include "analysis/scope_names.h"
#include "names/bindings.h"

namespace quillet {

inline constexpr size_t kNameRoleCount = static_cast<size_t>(NameRole::kDeclaration) + 1;

// The part of a source that a page shows: whole lines up to a limit, of each a limited part.
class ShownPart {
 public:
  static constexpr uint32_t kMostBytes = 8 << 20;
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
  uint32_t begin;   // of its bytes in the source
  uint32_t size;    // in bytes
  uint32_t line;    // from 0
  uint32_t symbol;  // index in symbols(); SiteOccurrences::kNone for an attribute
  NameRole role;
  NameKind kind;  // of what is defined here
  bool is_attribute;
};

struct SiteSymbol {
  Text name;
  uint32_t definition;  // the occurrence that a link leads to; kNone where the file defines it nowhere
  bool is_shared;       // of a module or a class
  bool is_imported;     // what it means stands in another file
};

// A definition as a search lists it.
struct SiteDefinition {
  uint32_t occurrence;
  Text scope;  // dotted, of what it stands in
};

class SiteOccurrences {
 public:
  static constexpr uint32_t kNone = UINT32_MAX;

  // What it gives stands until the next call or the next file.
  void Collect(const FileAnalyzer& file, const ScopeNames& scopes, PlacedRecords& placed, const ShownPart& shown);

  std::span<const SiteOccurrence> occurrences() const { return occurrences_; }  // in order of their places
  std::span<const SiteSymbol> symbols() const { return symbols_; }
  std::span<const SiteDefinition> definitions() const { return definitions_; }
  // What the records say of an occurrence's name beyond its role, such as ": int"; empty for most.
  Text FactsOf(size_t occurrence) const;
  // Whether other files may mean this occurrence's name.
  bool IsShared(const SiteOccurrence& occurrence) const {
    if (occurrence.symbol == kNone) return occurrence.is_attribute;
    return symbols_[occurrence.symbol].is_shared || symbols_[occurrence.symbol].is_imported;
  }

 private:
  struct Found {
    SiteOccurrence occurrence;
    uint32_t scope;  // index in ScopeNames::names()
  };
  struct Key {
    uint32_t scope;
    Text name;
    friend bool operator==(const Key&, const Key&) = default;
  };
  struct KeyHash {
    size_t operator()(const Key& key) const { return std::hash<Text>()(key.name) * 31 + key.scope; }
  };
  struct ScopeAround {
    uint32_t parent = kNone;
    bool is_class = false;
    bool is_shared = false;
  };

  void FindScopes(const ScopeNames& scopes);
  void AddRecord(const PlacedRecord& record, const FileAnalyzer& file, const ShownPart& shown);
  void AddFact(const PlacedRecord& record, uint32_t begin);
  void Settle(Text source, const ScopeNames& scopes);
  uint32_t SymbolOf(uint32_t scope, Text name) const;

  std::vector<Found> found_;
  std::vector<SiteOccurrence> occurrences_;
  std::vector<SiteSymbol> symbols_;
  std::vector<SiteDefinition> definitions_;
  std::unordered_map<Key, uint32_t, KeyHash> symbol_index_;
  std::vector<ScopeAround> scopes_;                  // by name of the scope
  std::unordered_map<uint32_t, std::string> facts_;  // by first byte
  std::unordered_map<uint32_t, NameKind> opened_;    // by first byte
};

}  // namespace quillet
