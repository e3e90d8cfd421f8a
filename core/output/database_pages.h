// Rows of integers, and an index of them, as pages of an SQLite database: in a fraction of the time that statements
// would take.
//
// SQLite makes the database, with an empty table and an empty index, and lets go of it. Then the pages that are made
// here are appended to the file, others replace the roots of the two, and the head is told how many pages there are:
// from there on it is a database like any other. The format is documented (sqlite.org/fileformat2.html) and stays.
// Both are trees. The leaves of a table hold its rows in the order of their ids, those of an index its keys; a page
// above has for each page below but its last one what separates that from the next: the last id of the one, and of an
// index a key, which is in no leaf.
#pragma once

#include <cstddef>
#include <cstdint>
#include <span>
#include <string>
#include <vector>

#include "foundations/text.h"

namespace quillet {

// The pages that come behind those of a database.
class DatabasePages {
 public:
  static constexpr size_t kHeadSize = 100;

  // `head` is what the database begins with. Throws ValueError where no pages can be appended to it.
  explicit DatabasePages(Text head);

  size_t page_size() const { return page_size_; }
  // With those of the database.
  uint32_t page_count() const { return page_count_; }

  // Appends a page and returns its number.
  uint32_t Append(Text page);
  // The pages that were not taken yet.
  std::string Take();

 private:
  size_t page_size_ = 0;
  uint32_t page_count_ = 0;
  std::string pages_;
};

// A tree of a database, from its first row or key to its last.
class DatabaseTree {
 public:
  static constexpr size_t kMostColumns = 8;
  // The first id that is too large.
  static constexpr uint64_t kIdLimit = uint64_t{1} << 56;

  enum class Kind : uint8_t { kTable, kIndex };

  DatabaseTree(Kind kind, DatabasePages& pages);

  // Adds a row or a key. That of a table has its id in front and comes in the order of ids, that of an index in the
  // order of its columns, the id of its row behind them. Throws ValueError for an id or columns that cannot be.
  void Add(uint64_t id, std::span<const uint32_t> columns);
  // Appends what is left, and returns the page of the root. Nothing may be added behind it.
  std::string Finish();

 private:
  // Cells from its end to its beginning, their places from its beginning to its end.
  struct Page {
    std::string bytes;
    size_t begin_of_places;
    size_t begin_of_cells;
    size_t count;
  };

  Page NewPage(bool is_leaf) const;
  static bool AddCell(Page& page, Text cell);  // false where it does not fit
  static std::string TakeLastCell(Page& page);
  static std::string& Ended(Page& page);
  void EndLeaf();
  std::string InnerPage(size_t begin, size_t& end) const;

  Kind kind_;
  DatabasePages& pages_;
  bool has_ended_ = false;
  uint64_t last_id_ = 0;
  Page leaf_;
  // The pages of the level under way, and what separates each from the next.
  std::vector<uint32_t> children_;
  std::vector<std::string> separators_;
};

}  // namespace quillet
