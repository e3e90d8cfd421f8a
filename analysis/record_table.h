// The records of a file as columns that own their bytes, for what outlives the analysis.
//
// Strings are offsets into one run of bytes, as columnar formats have them: entry i of `names` is the
// bytes from name_offsets[i] up to name_offsets[i + 1].
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "analysis/placed_records.h"

namespace quillet {

struct RecordTable {
  // A class, a function or a type alias.
  struct Definition {
    uint32_t scope;  // that it opens; index in scope_names
    ScopeNames::ScopeKind kind;
    uint32_t line, column;           // of its name, from 1
    uint32_t first_line, last_line;  // of its head's first line and of its body's last statement, from 1
  };

  std::vector<uint32_t> lines;    // from 1
  std::vector<uint32_t> columns;  // from 1, in UTF-8 bytes
  std::vector<uint32_t> scopes;   // index in scope_names
  std::vector<RecordKind> kinds;
  std::vector<uint8_t> is_parameter;
  std::vector<int64_t> name_offsets{0};
  std::vector<int64_t> detail_offsets{0};
  std::string names;
  std::string details;
  std::vector<std::string> scope_names;  // that of the module first
  std::vector<Definition> definitions;   // in order of their heads

  size_t size() const { return lines.size(); }
  Text NameAt(size_t i) const { return Slice(names, name_offsets, i); }
  Text DetailAt(size_t i) const { return Slice(details, detail_offsets, i); }
  // The bytes that it occupies, nearly.
  size_t ByteSize() const;

  // The records of a file that was analysed.
  void Fill(const FileAnalyzer& file, const ScopeNames& scopes, PlacedRecords& placed);

 private:
  static Text Slice(const std::string& bytes, const std::vector<int64_t>& offsets, size_t i) {
    return Text(bytes).substr(static_cast<size_t>(offsets[i]), static_cast<size_t>(offsets[i + 1] - offsets[i]));
  }
};

}  // namespace quillet
