// Expressions in strings and comments, read by the same loop over tokens of their own.
//
// Fields of formatted strings are code of the scope that the string stands in. Hints in strings and
// comments are not: they say what a name means, and nothing of the scope. A hint is written by people and
// may be prose; names are taken from it only where it can be an expression.
#include <algorithm>
#include <tuple>

#include "lines/expression_tokens.h"
#include "lines/string_hints.h"
#include "lines/token_search.h"
#include "lines/type_comment.h"
#include "names/reader.h"
#include "tokens/token_ends.h"

namespace quillet {

void NameReader::String(const Token& string) {
  front_ = Front::kValue;
  operand_ = kNoIndex;
  if (!embeds_) return;
  if (IsFormattedString(string)) return Fields(string);
  if (hints_.empty()) return;
  const auto index = static_cast<size_t>(at_ - hints_begin_);
  while (!hints_.empty() && hints_.front() < index) hints_ = hints_.subspan(1);
  if (hints_.empty() || hints_.front() != index) return;
  HintString(string);
  front_ = Front::kValue;
  operand_ = kNoIndex;
}

void NameReader::Fields(const Token& string) {
  if (depth_ == kMaxDepth) return;
  EmbeddedTokens& embedded = TokensOfDepth();
  AppendOwnFieldTokens(string, embedded.tokens, embedded.ranges);
  for (const TokenRange& range : embedded.ranges)
    Embedded(TokenSpan(embedded.tokens).subspan(range.begin, range.end - range.begin), {});
  front_ = Front::kValue;
  operand_ = kNoIndex;
}

// Whether the name is the prefix of a template string, whose string is the next token (no comment between).
bool NameReader::IsTemplatePrefix(const Token& prefix) const {
  if (!version_.AtLeast(3, 14) || at_ + 1 >= end_) return false;
  if (at_[1].code != tok::STRING || at_[1].text != prefix.end()) return false;
  const auto is_letter = [&](size_t i, char letter) { return (prefix.text[i] | 0x20) == letter; };
  if (prefix.length == 1) return is_letter(0, 't');
  return prefix.length == 2 && ((is_letter(0, 't') && is_letter(1, 'r')) || (is_letter(0, 'r') && is_letter(1, 't')));
}

// The tokeniser knows no such prefix, and ends the string at the first quote: its fields may hold more of
// the same, and what is in them is no name.
void NameReader::Template(const Token& prefix) {
  const char* const row_end = end_[-1].end();
  const char* string_end = (++at_)->end();
  if (template_budget_ > 0) {
    const bool is_raw = prefix.length == 2;
    const char* stop;
    const char* const found = NestedFormattedStringEnd(at_->text, row_end, is_raw, stop);
    if (found == nullptr) template_budget_ -= std::min(template_budget_, static_cast<size_t>(stop - at_->text));
    if (found != nullptr && found > string_end) string_end = found;
  }
  Fields({prefix.text, static_cast<uint32_t>(string_end - prefix.text), tok::STRING});
  while (at_ + 1 < end_ && at_[1].text < string_end) ++at_;
}

void NameReader::HintString(const Token& string) {
  const Text hint = ContentsOfStringHint(string);
  if (!IsNone(hint)) Hint(hint, kNameString | kNameAnnotation);
}

void NameReader::Comment(const Token& comment) {
  if (comment.code != tok::COMMENT || !in_row_) return;
  const Text text = comment.view();
  const TypeCommentHint hint = FindTypeCommentHint(text);
  if (!hint.found) return;
  const uint32_t scope = scope_;
  scope_ = statement_scope_;
  Hint(text.substr(hint.begin, hint.end - hint.begin), kNameComment | kNameAnnotation);
  scope_ = scope;
}

NameReader::EmbeddedTokens& NameReader::TokensOfDepth() {
  if (pool_.size() <= static_cast<size_t>(depth_)) pool_.emplace_back();
  EmbeddedTokens& embedded = pool_[static_cast<size_t>(depth_)];
  embedded.tokens.clear();
  embedded.ranges.clear();
  return embedded;
}

// A hint in the scope under way.
void NameReader::Hint(Text hint, uint8_t flags) {
  if (depth_ == kMaxDepth) return;
  EmbeddedTokens& embedded = TokensOfDepth();
  AppendExpressionTokens(hint.data(), hint.data() + hint.size(), embedded.tokens);
  if (embedded.tokens.empty() || !IsPlausible(embedded.tokens)) return;
  embedded.hints.clear();
  FindStringHintsOfType(embedded.tokens, embedded.hints);
  const uint32_t quiet = quiet_;
  const uint8_t outer_flags = flags_;
  quiet_ = scope_;
  flags_ = flags_ | flags;
  Embedded(embedded.tokens, embedded.hints);
  quiet_ = quiet;
  flags_ = outer_flags;
}

void NameReader::Embedded(TokenSpan tokens, std::span<const size_t> hints) {
  const auto saved = std::tuple(at_, end_, base_, front_, operand_, next_comprehension_, knows_comprehensions_, in_row_,
                                embeds_, hints_, hints_begin_);
  const size_t comprehensions = comprehensions_.size();
  ++depth_;
  in_row_ = false;
  embeds_ = true;
  next_comprehension_ = comprehensions;
  at_ = tokens.data();
  end_ = at_ + tokens.size();
  knows_comprehensions_ = false;
  hints_ = hints;
  hints_begin_ = at_;
  BeginBase();
  ReadTokens(false);
  EndBase();
  comprehensions_.resize(comprehensions);
  --depth_;
  std::tie(at_, end_, base_, front_, operand_, next_comprehension_, knows_comprehensions_, in_row_, embeds_, hints_,
           hints_begin_) = saved;
}

// Whether operands and operators take turns and brackets match, as they do in no sentence of two words.
bool NameReader::IsPlausible(TokenSpan tokens) const {
  if (tokens[0].view() == "ignore") return false;
  size_t depth = 0;
  bool is_behind_value = false;
  TokenCode last = tok::ENDMARKER;
  for (const Token& token : tokens) {
    switch (MarkOf(token)) {
      case Mark::kName:
      case Mark::kAsync:
      case Mark::kAwait:
      case Mark::kConstant:
        if (is_behind_value) return false;
        is_behind_value = true;
        break;
      case Mark::kString:
        if (is_behind_value && last != tok::STRING) return false;
        is_behind_value = true;
        break;
      case Mark::kOpen:
        ++depth;
        is_behind_value = false;
        break;
      case Mark::kClose:
        if (depth == 0) return false;
        --depth;
        is_behind_value = true;
        break;
      case Mark::kSkip:
        continue;
      case Mark::kDefinition:
        return false;
      default:
        if (token.code == tok::ERRORTOKEN || OnlyBeginsStatement(token.code)) return false;
        is_behind_value = false;
        break;
    }
    last = token.code;
  }
  return depth == 0 && (is_behind_value || last == tok::COMMA);
}

// The brackets in which a "for" stands make comprehensions; they are found in front, since what stands
// in front of the "for" belongs to them. Nearly no statement has one.
void NameReader::FindComprehensions(TokenSpan tokens) {
  size_t first = 0;
  while (first < tokens.size() && tokens[first].code != word::kFor) ++first;
  if (first >= tokens.size()) return;
  brackets_.clear();
  bracket_stack_.clear();
  for (const Token& token : tokens) {
    if (IsOpeningBracket(token.code)) {
      bracket_stack_.push_back(brackets_.size());
      brackets_.push_back({&token, false});
    } else if (IsClosingBracket(token.code)) {
      if (!bracket_stack_.empty()) bracket_stack_.pop_back();
    } else if (token.code == word::kFor && !bracket_stack_.empty()) {
      brackets_[bracket_stack_.back()].holds_for = true;
    }
  }
  for (const OpenBracket& bracket : brackets_) {
    if (bracket.holds_for) comprehensions_.push_back(bracket.at);
  }
}

}  // namespace quillet
