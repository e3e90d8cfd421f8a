// One row after another: place, scope, and the info string taken apart.
#include "analysis/placed_records.h"

#include <algorithm>
#include <charconv>
#include <optional>

#include "foundations/shown_text.h"
#include "foundations/stop.h"
#include "foundations/utf8.h"
#include "vocabulary/symbolinfo.h"

namespace quillet {

namespace {

constexpr Text kEllipsis = "\xE2\x80\xA6";

// The index of a name that is an argument's place; false for any other name.
bool ArgIndexOf(Text name, size_t& index) {
  if (!name.starts_with(kArgPrefix)) return false;
  name.remove_prefix(kPrefixLen);
  return std::from_chars(name.data(), name.data() + name.size(), index).ec == std::errc();
}

}  // namespace

void PlacedRecords::Begin(const FileAnalyzer& file, const ScopeNames& scopes) {
  file_ = &file;
  scopes_ = &scopes;
  budget_ = std::max(kSmallestBudget, kBudgetPerSourceByte * file.source().size());
  has_odd_bytes_ = !IsWellFormedUtf8(file.source().text());
  texts_.Reset();
}

void PlacedRecords::AddRow(size_t row) {
  spelled_at_ = 0;
  const FileAnalyzer::LineResult& result = file_->results()[row];
  const RecordStore& store = file_->store();
  CountSteps(1 + (result.record_end - result.record_begin) + (result.arg_record_end - result.arg_record_begin));
  in_signature_ = result.first_in_def && file_->rows()[row].kind == LineKind::kComment && FindSignature(row);
  for (uint32_t i = result.record_begin; i < result.record_end; ++i) Add(row, store.rows[i], false);
  for (uint32_t i = result.arg_record_begin; i < result.arg_record_end; ++i) Add(row, store.arg_rows[i], true);
}

void PlacedRecords::Add(size_t row, const Record& record, bool is_parameter) {
  PlacedRecord& placed = placed_.emplace_back();
  Text name = record.name();
  placed.scope = scopes_->scopes()[scopes_->ScopeOf(row, record, is_parameter)].name;
  placed.is_parameter = is_parameter;
  SetPlace(file_->rows()[row], name, placed);
  const RecordInWords words = DecodeInfo(record.info(), buffer_);
  placed.kind = words.kind;
  Text detail = words.detail;  // in two registers: a copy as one piece would wait for both halves to be written
  if (detail.data() == buffer_.data()) detail = texts_.Copy(detail);
  if (in_signature_ && placed.kind == RecordKind::kHint) placed.is_parameter = true;
  if (name.starts_with(kArgPrefix)) [[unlikely]]
    name = ShownArgument(name);
  placed.name = Shown(Cut(name));
  placed.detail = Shown(Cut(detail));
}

void PlacedRecords::SetPlace(const LineRow& row, Text name, PlacedRecord& placed) {
  const SourceText& source = file_->source();
  const char* at = name.data();
  if (name.empty() || !source.Holds(at)) at = PlaceOfCopy(row, name);
  const Position position = source.PositionFrom(static_cast<int32_t>(row.first_line), at);
  placed.line = static_cast<uint32_t>(position.line) + 1;
  placed.column = static_cast<uint32_t>(position.col) + 1;
}

// Whether the tokens from `first` on spell a name. The name may be of any length: its beginning is enough.
bool PlacedRecords::Spells(TokenSpan toks, size_t first, Text name) {
  constexpr size_t kMaxCompared = 200;
  const bool is_cut = name.size() > kMaxCompared;
  name = name.substr(0, kMaxCompared);
  for (size_t i = first; i < toks.size(); ++i) {
    if (IsSkipCode(toks[i].code)) continue;
    const Text token = toks[i].view();
    name.remove_prefix(std::min(name.find_first_not_of(' '), name.size()));
    if (is_cut && token.starts_with(name)) return true;
    if (!name.starts_with(token)) return false;
    name.remove_prefix(token.size());
    if (name.empty()) return true;
  }
  return false;
}

// A copy stands where the tokens spell it, and one that is spelled another way where they spell its
// first part, which is no attribute of something else. Copies come in the order of their tokens, so the
// search goes on where the last one was found, and gives up after a while.
const char* PlacedRecords::PlaceOfCopy(const LineRow& row, Text name) {
  constexpr uint32_t kMaxTokensSearched = 500;
  const TokenSpan toks = TokenSpan(file_->source().tokens).subspan(row.first_token, row.token_count);
  const Text root = RootOfName(name);
  const auto count = static_cast<uint32_t>(toks.size());
  std::optional<uint32_t> found;
  TokenCode before = tok::COMMENT;
  for (uint32_t i = 0; i < std::min(count, kMaxTokensSearched); ++i) {
    const uint32_t token = (spelled_at_ + i) % count;
    if (token == 0) before = tok::COMMENT;
    if (IsSkipCode(toks[token].code)) continue;
    const bool is_attribute = before == tok::DOT;
    before = toks[token].code;
    if (is_attribute) continue;
    if (Spells(toks, token, name)) {
      found = token;
      break;
    }
    if (!found && toks[token].view() == root) found = token;
  }
  if (found) {
    spelled_at_ = *found;
    return toks[*found].text;
  }
  const auto first = std::find_if(toks.begin(), toks.end(), [](const Token& tok) { return !IsSkipCode(tok.code); });
  return (first != toks.end() ? *first : toks.front()).text;
}

// ---- signature comments ----

// A method's comment may leave out the object itself: then there is one type less than parameters.
bool PlacedRecords::FindSignature(size_t row) {
  parameters_.clear();
  const ScopeNames::Scope& scope = scopes_->scopes()[scopes_->ScopeOfRow(row)];
  if (scope.kind != ScopeNames::ScopeKind::kFunction) return false;
  const RecordStore& store = file_->store();
  const FileAnalyzer::LineResult& head = file_->results()[scope.row];
  for (uint32_t i = head.arg_record_begin; i < head.arg_record_end; ++i) {
    if (store.arg_rows[i].info() == kSetPrefix) parameters_.push_back(store.arg_rows[i].name());
  }
  size_t type_count = 0;
  const FileAnalyzer::LineResult& comment = file_->results()[row];
  for (uint32_t i = comment.record_begin; i < comment.record_end; ++i) {
    size_t index;
    if (ArgIndexOf(store.rows[i].name(), index)) type_count = std::max(type_count, index + 1);
  }
  const bool is_method = scopes_->scopes()[scope.parent].kind == ScopeNames::ScopeKind::kClass;
  if (is_method && type_count + 1 == parameters_.size()) parameters_.erase(parameters_.begin());
  return true;
}

Text PlacedRecords::ShownArgument(Text name) {
  size_t index;
  if (in_signature_ && ArgIndexOf(name, index) && index < parameters_.size()) return parameters_[index];
  buffer_.clear();
  AppendArgumentPlace(name, buffer_);
  return texts_.Copy(buffer_);
}

// ---- what texts may be ----

Text PlacedRecords::Cut(Text text) {
  if (text.size() <= budget_) {
    budget_ -= text.size();
    return text;
  }
  budget_ = 0;
  if (text.size() <= kCutSize) return text;
  size_t size = kCutSize;
  while (size > 0 && !IsUtf8LeadByte(text[size])) --size;
  buffer_.assign(text.substr(0, size)).append(kEllipsis);
  return texts_.Copy(buffer_);
}

Text PlacedRecords::Shown(Text text) {
  if (!has_odd_bytes_ || IsWellFormedUtf8(text)) return text;
  buffer_.clear();
  AppendShown(text, buffer_);
  return texts_.Copy(buffer_);
}

}  // namespace quillet
