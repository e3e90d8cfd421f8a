// The expressions embedded in a line, each as a line of its own: fields of formatted strings, string
// literals that are type hints, and hints in comments.
//
// Their tokens are views into the same bytes, and their positions those of the physical line, so an
// error in one lands where it stands in the file. They are worked out from the bytes like those of
// any line; where the host gave the outer line's tokens positions of its own, they are counted from
// the token that holds the expression.
#include <algorithm>
#include <memory>

#include "lines/expression_tokens.h"
#include "lines/fstring_fields.h"
#include "lines/logical_line.h"
#include "lines/string_hints.h"
#include "lines/type_comment.h"
#include "lines/typing_names.h"

namespace quillet {

namespace {

using Found = EmbeddedExpressions::Found;

class EmbeddedSearch {
 public:
  EmbeddedSearch(TokenSpan toks, const TypingNames* typing, std::vector<Token>& tokens, std::vector<Found>& found)
      : toks_(toks), typing_(typing), tokens_(tokens), found_(found) {}

  void Run() {
    bool may_hold_hints = false;
    bool has_plain_string = false;
    for (const Token& token : toks_) {
      may_hold_hints |= token.code == tok::COLON || token.code == tok::RARROW || token.code == word::kCast;
      has_plain_string |= token.code == tok::STRING && !IsFormattedString(token);
    }
    if (typing_ != nullptr && typing_->has_renamed_cast()) may_hold_hints = true;
    if (may_hold_hints && has_plain_string && typing_ != nullptr)
      FindStringHints(toks_, *typing_, hints_, may_be_text_);
    else if (may_hold_hints && has_plain_string)
      FindStringHints(toks_, hints_);

    size_t next_hint = 0;
    for (size_t i = 0; i < toks_.size(); ++i) {
      if (next_hint < hints_.size() && hints_[next_hint] == i) {
        AddHint(LineKind::kStringifiedTypeHint, ContentsOfStringHint(toks_[i]), i,
                next_hint < may_be_text_.size() && may_be_text_[next_hint]);
        while (next_hint < hints_.size() && hints_[next_hint] == i) ++next_hint;
      }
      if (toks_[i].code == tok::STRING && IsFormattedString(toks_[i])) AddFields(i, toks_[i]);
      // Where they are no template string, the statement is rejected.
      if (typing_ != nullptr && toks_[i].code == tok::STRING && i > 0 && IsTemplateString(toks_[i - 1], toks_[i])) {
        const auto length = static_cast<uint32_t>(toks_[i].end() - toks_[i - 1].text);
        AddFields(i - 1, Token{toks_[i - 1].text, length, tok::STRING});
      }
      if (toks_[i].code == tok::COMMENT) AddCommentHint(i);
    }
  }

 private:
  void AddFields(size_t i, const Token& string) {
    fields_.clear();
    AppendFieldTokens(string, tokens_, fields_, typing_ != nullptr);
    for (const TokenRange& field : fields_) AddFound(LineKind::kFstringFieldExp, field, i);
  }

  void AddCommentHint(size_t i) {
    const Text comment = toks_[i].view();
    const TypeCommentHint hint = FindTypeCommentHint(comment);
    if (hint.found) AddHint(LineKind::kCommentedTypeHint, comment.substr(hint.begin, hint.end - hint.begin), i);
  }

  void AddHint(LineKind kind, Text hint, size_t i, bool may_be_text = false) {
    if (IsNone(hint)) return;
    const size_t begin = tokens_.size();
    AppendExpressionTokens(hint.data(), hint.data() + hint.size(), tokens_);
    if (tokens_.size() > begin) AddFound(kind, {begin, tokens_.size()}, i, may_be_text);
  }

  void AddFound(LineKind kind, TokenRange range, size_t outer, bool may_be_text = false) {
    found_.push_back({kind, static_cast<uint32_t>(range.begin), static_cast<uint32_t>(range.end),
                      static_cast<uint32_t>(outer), may_be_text});
  }

  TokenSpan toks_;
  const TypingNames* typing_;
  std::vector<Token>& tokens_;
  std::vector<Found>& found_;
  std::vector<size_t> hints_;
  std::vector<bool> may_be_text_;
  std::vector<TokenRange> fields_;
};

}  // namespace

// Positions inside of one token, counted from that token's own.
class EmbeddedExpressions::PlacesInToken {
 public:
  PlacesInToken(const Token& token, Position position) : token_(token), position_(position) {
    for (const char* at = token.text; at < token.end(); ++at)
      if (*at == '\n' || (*at == '\r' && (at + 1 == token.end() || at[1] != '\n'))) line_starts_.push_back(at + 1);
  }

  Position Of(const char* at) const {
    const auto next = std::upper_bound(line_starts_.begin(), line_starts_.end(), at);
    const auto lines = static_cast<int32_t>(next - line_starts_.begin());
    if (lines == 0) return {position_.line, position_.col + static_cast<int32_t>(at - token_.text)};
    return {position_.line + lines, static_cast<int32_t>(at - *(next - 1))};
  }

 private:
  Token token_;
  Position position_;
  std::vector<const char*> line_starts_;
};

EmbeddedExpressions::EmbeddedExpressions(const LogicalLine& line, const TypingNames* typing)
    : outer_toks_(line.toks), first_line_(line.first_line), has_stored_positions_(line.has_stored_positions()) {
  // Only bytes of the source are followed by what a scan may load.
  if (!line.source) return;
  for (const Token& token : line.toks)
    if (!token.removed() && !line.source->Holds(token.text)) return;
  std::vector<Token> tokens;
  EmbeddedSearch(line.toks, typing, tokens, found_).Run();
  if (found_.empty()) return;
  inner_ = SourceText::Within(line.source);
  inner_->tokens = std::move(tokens);
  outer_positions_ = line.positions();
}

EmbeddedExpressions::~EmbeddedExpressions() = default;

void EmbeddedExpressions::Show(size_t index, LogicalLine& line) {
  const Found& found = found_[index];
  line.ClearDerivedInfo();
  if (line.has_stored_positions()) line.UseSourcePositions();
  line.HoldSource(inner_);
  line.toks = TokenSpan(inner_->tokens).subspan(found.begin, found.end - found.begin);
  line.token_count = static_cast<int32_t>(line.toks.size());
  line.kind = found.kind;
  line.first_line = 0;
  if (!has_stored_positions_) {
    line.first_line = first_line_;
    line.first_line += line.positions().LineOf(0);
  } else if (found.outer < outer_positions_.size()) {
    if (places_ == nullptr || places_of_ != found.outer) {
      places_ = std::make_unique<PlacesInToken>(outer_toks_[found.outer], outer_positions_[found.outer]);
      places_of_ = found.outer;
    }
    const int32_t line_of_first = places_->Of(line.toks.front().text).line;
    line.first_line = first_line_ + line_of_first;
    std::vector<Position> own_positions;
    own_positions.reserve(line.toks.size());
    for (const Token& token : line.toks) {
      own_positions.push_back(places_->Of(token.text));
      own_positions.back().line -= line_of_first;
    }
    line.SetPositions(std::move(own_positions));
  }
}

EmbeddedLines LogicalLine::DirectGetExpLogicals() const {
  EmbeddedLines embedded;
  EmbeddedExpressions found(*this);
  for (size_t i = 0; i < found.size(); ++i) {
    embedded.owned.push_back(std::make_unique<LogicalLine>());
    embedded.lines.push_back(embedded.owned.back().get());
    found.Show(i, *embedded.owned.back());
  }
  return embedded;
}

}  // namespace quillet
