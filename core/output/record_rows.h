// The records of files as a table of a database, in which each text of all files has a number, and an index of them by
// name and scope.
#pragma once

#include <cstdint>
#include <string>
#include <tuple>
#include <vector>

#include "analysis/record_table.h"
#include "foundations/text.h"
#include "names/text_table.h"
#include "output/database_pages.h"

namespace quillet {

class RecordRows {
 public:
  // `head` is that of the database, as DatabasePages takes it.
  explicit RecordRows(Text head);

  // Adds the records of a file. Their columns are an id from `first_id` on, which is above all before, name, scope,
  // line, column, kind, is_parameter, opens and detail. Throws ValueError.
  void Add(const RecordTable& records, uint64_t first_id);
  // Behind the last file: the root of the table. Throws ValueError behind itself, as does Add.
  std::string FinishTable();
  // Then: appends a part of the index, and returns whether there is more.
  bool AddToIndex();
  // At last: the root of the index.
  std::string FinishIndex();

  DatabasePages& pages() { return pages_; }
  // The texts that name and scope number, and those of detail, as they are shown (shown_text.h); 0 is no text.
  const TextTable& names() const { return names_; }
  const TextTable& details() const { return details_; }

 private:
  struct Key {
    uint32_t name, scope;
    uint64_t id;
    friend bool operator<(const Key& a, const Key& b) {
      return std::tie(a.name, a.scope, a.id) < std::tie(b.name, b.scope, b.id);
    }
  };

  void SetNumbers(const TextList& texts, TextTable& table, std::vector<uint32_t>& numbers);

  DatabasePages pages_;
  DatabaseTree table_{DatabaseTree::Kind::kTable, pages_};
  DatabaseTree index_{DatabaseTree::Kind::kIndex, pages_};
  std::vector<Key> keys_;
  size_t indexed_ = 0;  // of the keys, which are in order by then
  TextTable names_;
  TextTable details_;
  // Of the texts of a file.
  std::vector<uint32_t> name_numbers_;
  std::vector<uint32_t> scope_numbers_;
  std::vector<uint32_t> detail_numbers_;
  std::string shown_;
};

}  // namespace quillet
