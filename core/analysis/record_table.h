// The records of a file as columns that own their bytes, for what outlives the analysis.
//
// Names, details and scopes repeat, so a column of texts holds numbers: places in a list that has each
// text of the file once.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <unordered_map>
#include <vector>

#include "analysis/placed_records.h"
#include "foundations/text_numbers.h"

namespace quillet {

// Texts one behind the other, as columnar formats have them: text i is the bytes from offsets[i] up to
// offsets[i + 1].
struct TextList {
  std::vector<int64_t> offsets{0};
  std::string bytes;

  size_t size() const { return offsets.size() - 1; }
  Text operator[](size_t i) const {
    return Text(bytes).substr(static_cast<size_t>(offsets[i]), static_cast<size_t>(offsets[i + 1] - offsets[i]));
  }
  void Add(Text text) {
    bytes.append(text);
    offsets.push_back(static_cast<int64_t>(bytes.size()));
  }
};

struct RecordTable {
  // What a name is set to where its statement opens a scope.
  enum class Opens : uint8_t { kNothing, kClass, kFunction };

  // A class, a function or a type alias.
  struct Definition {
    uint32_t scope;  // that it opens; index in scope_texts
    ScopeNames::ScopeKind kind;
    uint32_t line, column;           // of its name, from 1
    uint32_t first_line, last_line;  // of its head's first line and of its body's last statement, from 1
  };

  std::vector<uint32_t> lines;    // from 1
  std::vector<uint32_t> columns;  // from 1, in UTF-8 bytes
  std::vector<uint32_t> scopes;   // index in scope_texts
  std::vector<uint32_t> names;    // index in name_texts
  std::vector<uint32_t> details;  // index in detail_texts
  std::vector<RecordKind> kinds;
  std::vector<uint8_t> is_parameter;
  std::vector<Opens> opens;
  TextList scope_texts;  // that of the module first
  TextList name_texts;
  TextList detail_texts;
  std::vector<Definition> definitions;  // in order of their heads

  size_t size() const { return lines.size(); }
  Text ScopeAt(size_t i) const { return scope_texts[scopes[i]]; }
  Text NameAt(size_t i) const { return name_texts[names[i]]; }
  Text DetailAt(size_t i) const { return detail_texts[details[i]]; }
  // The bytes that it occupies, nearly.
  size_t ByteSize() const;
};

// Makes tables of files that were analysed, one after the other.
class RecordTableMaker {
 public:
  RecordTable Make(const FileAnalyzer& file, const ScopeNames& scopes, PlacedRecords& placed);

 private:
  static uint32_t NumberOf(Text text, TextNumbers& numbers, TextList& texts);
  static void AddDefinitions(const FileAnalyzer& file, const ScopeNames& scopes, RecordTable& table);
  void SetOpens(RecordTable& table);

  // The texts of the file under way, which are the placed records'.
  TextNumbers names_;
  TextNumbers details_;
  std::unordered_map<uint64_t, RecordTable::Opens> opens_;  // by line and column
};

}  // namespace quillet
