// Records in words and in their place: for each row of two byte ranges the kind, the detail, the line
// and column of the name, and the scope.
//
// Input: a file that was analysed, and its scopes. A name's place follows from its bytes, which nearly
// always are a view of the source. A copy stands where the statement spells its first part, and a name
// that the statement does not spell where the statement begins.
// A signature comment on a line of its own knows parameters by their places alone; here it meets the
// head of its function, and its records become facts about the real parameters.
// The trap: views overlap (a.b.c.d gives four names in one), so the texts of all records together may
// grow with the square of the source. Behind a budget in proportion to the source, long texts are cut.
// All texts are UTF-8, whatever the source is.
#pragma once

#include <cstdint>
#include <span>
#include <string>
#include <vector>

#include "analysis/file_analyzer.h"
#include "analysis/record_words.h"
#include "analysis/scope_names.h"
#include "foundations/arena.h"

namespace quillet {

struct PlacedRecord {
  Text name;
  Text detail;  // empty where the kind says everything
  uint32_t line = 0;
  uint32_t column = 0;  // both from 1, the column in UTF-8 bytes
  uint32_t scope = 0;   // index in ScopeNames::names()
  RecordKind kind = RecordKind::kSet;
  bool is_parameter = false;
};

class PlacedRecords {
 public:
  // Texts of a file's records may hold so many bytes before long ones are cut, and are cut to that.
  static constexpr size_t kBudgetPerSourceByte = 16;
  static constexpr size_t kSmallestBudget = size_t{1} << 20;
  static constexpr size_t kCutSize = 200;

  // Both stand until the next call.
  void Begin(const FileAnalyzer& file, const ScopeNames& scopes);

  // The records of a row, in the order in which they were found, parameters last. They stand until the
  // next call; texts until Begin.
  std::span<const PlacedRecord> OfRow(size_t row) {
    Clear();
    AddRow(row);
    return records();
  }
  // The same for several rows, one behind the other.
  void Clear() { placed_.clear(); }
  void DropFirst(size_t count) { placed_.erase(placed_.begin(), placed_.begin() + static_cast<ptrdiff_t>(count)); }
  void AddRow(size_t row);
  std::span<const PlacedRecord> records() const { return placed_; }

 private:
  void Add(size_t row, const Record& record, bool is_parameter);
  void SetPlace(const LineRow& row, Text name, PlacedRecord& placed);
  bool FindSignature(size_t row);
  Text ShownArgument(Text name);
  static bool Spells(TokenSpan toks, size_t first, Text name);
  const char* PlaceOfCopy(const LineRow& row, Text name);
  Text Cut(Text text);
  Text Shown(Text text);

  const FileAnalyzer* file_ = nullptr;
  const ScopeNames* scopes_ = nullptr;
  size_t budget_ = 0;
  bool has_odd_bytes_ = false;
  uint32_t spelled_at_ = 0;  // the token of the row's last copy that was found, counted from its first
  std::vector<PlacedRecord> placed_;
  std::vector<Text> parameters_;
  bool in_signature_ = false;
  std::string buffer_;
  TextArena texts_;
};

}  // namespace quillet
