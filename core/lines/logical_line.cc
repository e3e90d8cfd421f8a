// The record of one statement: its positions, its own or shared store of records, its text.
#include "lines/logical_line.h"

#include <algorithm>
#include <iterator>
#include <utility>

namespace quillet {

namespace {

constexpr Text kLineKindTexts[] = {
#define QUILLET_LINE_KIND(identifier, text) text,
#include "lines/line_kinds.def"
};

}  // namespace

Text TextOfLineKind(LineKind kind) {
  const auto index = static_cast<size_t>(kind);
  return index < std::size(kLineKindTexts) ? kLineKindTexts[index] : Text("");
}

LineKind LineKindOfText(Text text) {
  const auto found = std::find(std::begin(kLineKindTexts), std::end(kLineKindTexts), text);
  static_assert(static_cast<size_t>(LineKind::kOther) == std::size(kLineKindTexts));
  return static_cast<LineKind>(found - std::begin(kLineKindTexts));
}

// ---- positions ----

Position PositionView::operator[](size_t index) const {
  if (stored_) return stored_[index];
  // A token that was removed, or that is not of the source, stands nowhere.
  if (!source_ || !source_->Holds(toks_[index].text)) return {};
  Position position = source_->PositionFrom(first_line_, toks_[index].text);
  position.line -= first_line_;
  return position;
}

PositionView PositionView::First(size_t count) const { return Slice(0, count); }

PositionView PositionView::Slice(size_t begin, size_t end) const {
  end = std::min(end, size_);
  begin = std::min(begin, end);
  PositionView slice = *this;
  if (stored_) slice.stored_ += begin;
  if (toks_) slice.toks_ += begin;
  slice.size_ = end - begin;
  return slice;
}

PositionView LogicalLine::positions() const {
  if (has_stored_positions_) return PositionView(stored_positions_);
  return PositionView(source, toks, first_line);
}

std::vector<Position> LogicalLine::SetPositions(std::vector<Position> positions) {
  has_stored_positions_ = true;
  return std::exchange(stored_positions_, std::move(positions));
}

void LogicalLine::UseSourcePositions() {
  stored_positions_.clear();
  has_stored_positions_ = false;
}

// ---- operations ----

int LogicalLine::GetTokType(int64_t index) {
  if (hooks) [[unlikely]]
    return hooks->GetTokType(*this, index);
  const auto count = static_cast<int64_t>(toks.size());
  if (index < 0) index += count;
  if (index < 0 || index >= count) ThrowError(ErrorKind::kIndexError, "list index out of range");
  return TypeOfCode(toks[static_cast<size_t>(index)].code);
}

void LogicalLine::AppendTypeEquiv(Text name, Text equiv) {
  if (hooks) [[unlikely]]
    return hooks->AppendTypeEquiv(*this, name, equiv);
  DirectAppend(texts().Copy(name), texts().Copy(equiv));
}

void LogicalLine::AppendArgTypeEquiv(Text name, Text info) {
  if (hooks) [[unlikely]]
    return hooks->AppendArgTypeEquiv(*this, name, info);
  DirectAppendArg(texts().Copy(name), texts().Copy(info));
}

void LogicalLine::CopyTypeEquivsTo(LogicalLine& to) {
  if (hooks) [[unlikely]]
    return hooks->CopyTypeEquivs(*this, to);
  const auto copy = [&to](const Record& record) {
    // A name that stands in the source is kept as a view, which tells its place.
    const bool in_source = to.source && to.source->Holds(record.name_text);
    to.AppendStableTypeEquiv(in_source ? record.name() : to.texts().Copy(record.name()),
                             to.texts().Copy(record.info()));
  };
  if (to.hooks) [[unlikely]] {
    // The host's code may clear this line meanwhile.
    const std::vector<Record> rows(type_equivs().begin(), type_equivs().end());
    for (const Record& record : rows) copy(record);
    return;
  }
  // By index: with a shared store the rows move as the other line's grow.
  for (size_t i = 0; i < type_equivs().size(); ++i) copy(Record(type_equivs()[i]));
}

// Rows behind this line's own belong to another line by now and stay; its own are then merely let go.
void LogicalLine::DirectClearDerivedInfo() {
  if (!store_) return;
  if (store_->rows.size() == row_begin_ + row_count_) store_->rows.resize(row_begin_);
  if (store_->arg_rows.size() == arg_row_begin_ + arg_row_count_) store_->arg_rows.resize(arg_row_begin_);
  row_begin_ = static_cast<uint32_t>(store_->rows.size());
  arg_row_begin_ = static_cast<uint32_t>(store_->arg_rows.size());
  row_count_ = arg_row_count_ = 0;
  if (store_ == own_store_.get()) store_->texts.Reset();
}

void LogicalLine::MakeOwnStore() {
  own_store_ = std::make_unique<RecordStore>();
  WriteTo(own_store_.get());
}

// ---- text ----

namespace {

// The most blanks or line ends that take the place of what is not the line's own text. It is far from
// what people write, and bounds the texts of the many errors that one physical line of broken code may
// hold: each of them would be as long as all in front of it.
constexpr int64_t kMaxGap = 1 << 10;

// Text under construction, and the line and column at which it ends.
class SpelledText {
 public:
  void MoveTo(Position place) {
    if (place.line > line_) {
      text_.append(static_cast<size_t>(std::min(place.line - line_, kMaxGap)), '\n');
      line_ = place.line;
      col_ = 0;
    }
    if (place.line == line_ && place.col > col_) {
      text_.append(static_cast<size_t>(std::min(place.col - col_, kMaxGap)), ' ');
      col_ = place.col;
    }
  }

  void Append(Text token) {
    text_.append(token);
    for (size_t i = 0; i < token.size(); ++i) {
      const bool ends_line = token[i] == '\n' || (token[i] == '\r' && token.substr(i + 1, 1) != "\n");
      col_ = ends_line ? 0 : col_ + 1;
      line_ += ends_line;
    }
  }

  std::string Take() { return std::move(text_); }

 private:
  std::string text_;
  int64_t line_ = 0;
  int64_t col_ = 0;
};

}  // namespace

std::string TextFromTokens(TokenSpan toks, const PositionView& positions) {
  SpelledText text;
  for (size_t i = 0; i < toks.size() && i < positions.size(); ++i) {
    if (toks[i].removed()) continue;
    text.MoveTo(positions[i]);
    text.Append(toks[i].view());
  }
  return text.Take();
}

std::string TextFromTokens(const LogicalLine& line) { return TextFromTokens(line.toks, line.positions()); }

}  // namespace quillet
