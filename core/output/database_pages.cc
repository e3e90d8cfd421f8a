// A leaf is filled cell by cell; the pages above are made at the end, level by level, and the only page of the last
// level is the root.
#include "output/database_pages.h"

#include <array>
#include <utility>

#include "foundations/errors.h"

namespace quillet {

namespace {

constexpr Text kMagic("SQLite format 3\0", 16);
// Places in the head.
constexpr size_t kPageSizeAt = 16;
constexpr size_t kReservedAt = 20;
constexpr size_t kPageCountAt = 28;
constexpr size_t kSchemaFormatAt = 44;
// From this format on 0 and 1 take no bytes.
constexpr uint32_t kSchemaFormat = 4;
// The page with this byte is nobody's: locks are taken on it.
constexpr uint64_t kLockByte = uint64_t{1} << 30;

// In the head of a page.
constexpr size_t kCellCountAt = 3;
constexpr size_t kBeginOfCellsAt = 5;
constexpr size_t kLastChildAt = 8;
constexpr size_t kLeafHead = 8;
constexpr size_t kInnerHead = 12;

constexpr size_t kMostVarint = 8;  // of numbers below kIdLimit

uint32_t BigEndian(Text bytes, size_t at, size_t size) {
  uint32_t value = 0;
  for (size_t i = 0; i < size; ++i) value = value << 8 | static_cast<unsigned char>(bytes[at + i]);
  return value;
}

char* PutBigEndian(uint64_t value, size_t size, char* at) {
  for (size_t i = size; i-- > 0; value >>= 8) at[i] = static_cast<char>(value);
  return at + size;
}

// Seven bits a byte, the high ones first, the top bit set where more follow.
char* PutVarint(uint64_t value, char* at) {
  size_t size = 1;
  while (value >> (7 * size) != 0) ++size;
  for (size_t i = size; i-- > 0;) *at++ = static_cast<char>((value >> (7 * i) & 0x7F) | (i > 0 ? 0x80 : 0));
  return at;
}

// A record: the size of its head, the type of each column, the columns.
class RecordBytes {
 public:
  explicit RecordBytes(size_t columns) { head_[0] = static_cast<char>(1 + columns); }

  void AddNull() { head_[head_size_++] = 0; }
  void Add(uint64_t value) {
    if (value <= 1) {
      head_[head_size_++] = static_cast<char>(8 + value);
      return;
    }
    constexpr std::array<uint8_t, 6> kSizes = {1, 2, 3, 4, 6, 8};
    size_t type = 0;
    while (value >> (8 * kSizes[type] - 1) != 0) ++type;
    head_[head_size_++] = static_cast<char>(1 + type);
    PutBigEndian(value, kSizes[type], columns_.data() + columns_size_);
    columns_size_ += kSizes[type];
  }

  size_t size() const { return head_size_ + columns_size_; }
  char* CopyTo(char* at) const {
    at += Text(head_.data(), head_size_).copy(at, head_size_);
    return at + Text(columns_.data(), columns_size_).copy(at, columns_size_);
  }

 private:
  std::array<char, 2 + DatabaseTree::kMostColumns> head_;
  std::array<char, 8 * (1 + DatabaseTree::kMostColumns)> columns_;
  size_t head_size_ = 1;
  size_t columns_size_ = 0;
};

}  // namespace

// ---- pages ----

DatabasePages::DatabasePages(Text head) {
  if (head.size() < kHeadSize || !head.starts_with(kMagic))
    ThrowError(ErrorKind::kValueError, "this is no head of an SQLite database");
  const uint32_t size = BigEndian(head, kPageSizeAt, 2);
  page_size_ = size == 1 ? 65536 : size;
  page_count_ = BigEndian(head, kPageCountAt, 4);
  const bool is_plain = head[kReservedAt] == 0 && BigEndian(head, kSchemaFormatAt, 4) == kSchemaFormat;
  if (!is_plain || page_size_ < 512 || page_count_ == 0)
    ThrowError(ErrorKind::kValueError, "no pages can be appended to this SQLite database");
}

uint32_t DatabasePages::Append(Text page) {
  if (page_count_ >= UINT32_MAX - 2) ThrowError(ErrorKind::kValueError, "the SQLite database is full");
  if (page_count_ * uint64_t{page_size_} == kLockByte) {
    pages_.append(page_size_, '\0');
    ++page_count_;
  }
  pages_.append(page);
  return ++page_count_;
}

std::string DatabasePages::Take() { return std::exchange(pages_, {}); }

// ---- trees ----

DatabaseTree::DatabaseTree(Kind kind, DatabasePages& pages) : kind_(kind), pages_(pages), leaf_(NewPage(true)) {}

DatabaseTree::Page DatabaseTree::NewPage(bool is_leaf) const {
  const size_t size = pages_.page_size();
  Page page = {std::string(size, '\0'), is_leaf ? kLeafHead : kInnerHead, size, 0};
  page.bytes[0] = static_cast<char>((is_leaf ? 8 : 0) | (kind_ == Kind::kTable ? 5 : 2));
  return page;
}

bool DatabaseTree::AddCell(Page& page, Text cell) {
  const size_t place = page.begin_of_places + 2 * page.count;
  if (place + 2 + cell.size() > page.begin_of_cells) return false;
  page.begin_of_cells -= cell.size();
  cell.copy(page.bytes.data() + page.begin_of_cells, cell.size());
  PutBigEndian(page.begin_of_cells, 2, page.bytes.data() + place);
  ++page.count;
  return true;
}

std::string DatabaseTree::TakeLastCell(Page& page) {
  --page.count;
  const size_t end =
      page.count == 0 ? page.bytes.size() : BigEndian(page.bytes, page.begin_of_places + 2 * (page.count - 1), 2);
  std::string cell = page.bytes.substr(page.begin_of_cells, end - page.begin_of_cells);
  page.begin_of_cells = end;
  return cell;
}

std::string& DatabaseTree::Ended(Page& page) {
  PutBigEndian(page.count, 2, page.bytes.data() + kCellCountAt);
  PutBigEndian(page.begin_of_cells, 2, page.bytes.data() + kBeginOfCellsAt);  // 65536 as 0
  return page.bytes;
}

void DatabaseTree::Add(uint64_t id, std::span<const uint32_t> columns) {
  const bool is_table = kind_ == Kind::kTable;
  const bool is_next = !is_table || (leaf_.count == 0 && children_.empty()) || id > last_id_;
  if (has_ended_ || !is_next || id >= kIdLimit || columns.size() > kMostColumns)
    ThrowError(ErrorKind::kValueError, "this cannot be the next row of a table, or key of an index");
  RecordBytes record(1 + columns.size());
  if (is_table) record.AddNull();  // the id, which is in the cell
  for (const uint32_t column : columns) record.Add(column);
  if (!is_table) record.Add(id);
  std::array<char, 2 * kMostVarint + sizeof record> cell;
  char* end = PutVarint(record.size(), cell.data());
  if (is_table) end = PutVarint(id, end);
  end = record.CopyTo(end);
  const Text bytes(cell.data(), static_cast<size_t>(end - cell.data()));
  if (!AddCell(leaf_, bytes)) {
    EndLeaf();
    AddCell(leaf_, bytes);
  }
  last_id_ = id;
}

void DatabaseTree::EndLeaf() {
  if (kind_ == Kind::kTable) {
    std::array<char, kMostVarint> id;
    separators_.emplace_back(id.data(), PutVarint(last_id_, id.data()));
  } else {
    separators_.push_back(TakeLastCell(leaf_));
  }
  children_.push_back(pages_.Append(Ended(leaf_)));
  leaf_ = NewPage(true);
}

// A page above as many children as it takes, from `begin` up to `end`.
std::string DatabaseTree::InnerPage(size_t begin, size_t& end) const {
  Page page = NewPage(false);
  size_t at = begin;
  for (; at + 1 < children_.size(); ++at) {
    std::string cell(4, '\0');
    PutBigEndian(children_[at], 4, cell.data());
    if (!AddCell(page, cell.append(separators_[at]))) break;
  }
  // A page that would be left for the last child alone gets another one.
  if (at + 2 == children_.size()) {
    TakeLastCell(page);
    --at;
  }
  PutBigEndian(children_[at], 4, page.bytes.data() + kLastChildAt);
  end = at + 1;
  return std::move(Ended(page));
}

std::string DatabaseTree::Finish() {
  if (has_ended_) ThrowError(ErrorKind::kValueError, "the tree has ended");
  has_ended_ = true;
  if (children_.empty()) return std::move(Ended(leaf_));
  children_.push_back(pages_.Append(Ended(leaf_)));
  for (;;) {
    std::vector<uint32_t> above;
    std::vector<std::string> separators;
    for (size_t begin = 0, end = 0; begin < children_.size(); begin = end) {
      std::string page = InnerPage(begin, end);
      if (begin == 0 && end == children_.size()) return page;
      above.push_back(pages_.Append(page));
      if (end < children_.size()) separators.push_back(std::move(separators_[end - 1]));
    }
    children_ = std::move(above);
    separators_ = std::move(separators);
  }
}

}  // namespace quillet
