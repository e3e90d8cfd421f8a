// Strings with the expressions in them, and the hints in strings and comments.
//
// A field is read whatever it holds. A hint is written by people and may be prose: what is no whole
// expression is none.
#include <algorithm>

#include "lines/expression_tokens.h"
#include "lines/string_hints.h"
#include "lines/type_comment.h"
#include "syntax/reader_impl.h"
#include "tokens/token_ends.h"

namespace quillet {

namespace {

// Of the letters in front of the quotes.
uint8_t BitsOfString(Text string) {
  uint8_t bits = 0;
  for (const char c : string) {
    switch (c) {
      case 'b':
      case 'B':
        bits |= kStringBytes;
        break;
      case 'u':
      case 'U':
        bits |= kStringUnicode;
        break;
      case 'f':
      case 'F':
        bits |= kStringFormatted;
        break;
      case 't':
      case 'T':
        bits |= kStringTemplate;
        break;
      case 'r':
      case 'R':
        bits |= kStringRaw;
        break;
      default:
        return bits;
    }
  }
  return bits;
}

}  // namespace

// All strings that stand behind each other are one.
ExprId SyntaxReader::Impl::String() {
  const uint32_t begin = Begin();
  const size_t mark = scratch_.size();
  uint8_t bits = 0;
  bool is_hint = false;
  while (true) {
    if (Is(tok::STRING)) {
      const uint8_t own = BitsOfString(place_.at->view());
      bits |= own;
      if (embeds_ && (own & kStringFormatted) != 0) {
        Fields(*place_.at);
      } else if (!place_.hints.empty()) {
        while (!place_.hints.empty() && place_.hints.front() < Index()) place_.hints = place_.hints.subspan(1);
        if (!place_.hints.empty() && place_.hints.front() == Index()) {
          const ExprId hint = HintOf(*place_.at);
          is_hint = hint != kNoExpr;
          if (is_hint) Push(hint);
        }
      }
      Step();
    } else if (IsTemplatePrefix(*place_.at)) {
      JoinTemplate();
      bits |= BitsOfString(place_.at->view());
      Fields(*place_.at);
      Step();
    } else {
      break;
    }
  }
  const ExprId string = Add(ExprKind::kString, begin, LastEnd(), bits);
  if (scratch_.size() > mark) TakeChildren(string, mark);
  if (is_hint) Flag(string, kHoldsHint);
  return string;
}

// Whether the token is the prefix of a template string, which the next one is: the tokeniser knows none.
bool SyntaxReader::Impl::IsTemplatePrefix(const Token& prefix) const {
  if (prefix.code != tok::NAME || prefix.length > 2) return false;
  const Token& string = *(&prefix + 1);
  if (string.code != tok::STRING || string.text != prefix.end() || !IsQuote(*string.text)) return false;
  const uint8_t bits = BitsOfString(prefix.view());
  return bits == kStringTemplate ? prefix.length == 1 : bits == (kStringTemplate | kStringRaw);
}

// Puts the prefix and what it is the prefix of into one token, the last of those they were. To the
// tokeniser it ended at the first quote of its own, which fields may hold.
void SyntaxReader::Impl::JoinTemplate() {
  const Token prefix = *place_.at;
  Step();
  const char* string_end = place_.at->end();
  if (search_budget_ > 0) {
    const char* const row_end = place_.end[-1].end();
    const char* stop;
    const char* const found = NestedFormattedStringEnd(place_.at->text, row_end, prefix.length == 2, stop);
    if (found == nullptr) search_budget_ -= std::min(search_budget_, static_cast<size_t>(stop - place_.at->text));
    if (found != nullptr && found > string_end) string_end = found;
  }
  while (place_.at + 1 < place_.end && place_.at[1].text < string_end) Step();
  *place_.at = {prefix.text, static_cast<uint32_t>(string_end - prefix.text), tok::STRING};
}

// The values of a string's fields, onto the stack.
void SyntaxReader::Impl::Fields(const Token& string) {
  if (TooDeep()) return;
  EmbeddedTokens& embedded = TokensOfDepth();
  AppendOwnFieldTokens(string, embedded.tokens, embedded.ranges);
  for (const TokenRange& range : embedded.ranges) {
    const ExprId value =
        Embedded(TokenSpan(embedded.tokens).subspan(range.begin, range.end - range.begin), embedded, false);
    Push(value);
  }
}

// What a string says that stands for a type, or none.
ExprId SyntaxReader::Impl::HintOf(const Token& string) {
  const Text hint = ContentsOfStringHint(string);
  return IsNone(hint) ? kNoExpr : Hint(hint);
}

ExprId SyntaxReader::Impl::CommentHint(const Token& comment) {
  const TypeCommentHint found = FindTypeCommentHint(comment.view());
  return found.found ? Hint(comment.view().substr(found.begin, found.end - found.begin)) : kNoExpr;
}

// The comments in front of the next token are those of the statement; the last one says what it is.
void SyntaxReader::Impl::TakeComments(StmtId stmt) {
  for (; next_comment_ < comments_.size() && comments_[next_comment_].index <= Index(); ++next_comment_) {
    const Token& comment = comments_[next_comment_].token;
    // One of what broke off in front of it is nobody's.
    if (OffsetOf(comment) < out_->stmts[stmt].begin) continue;
    const ExprId hint = CommentHint(comment);
    Stmt& of = out_->stmts[stmt];
    if (hint == kNoExpr || (of.hint != kNoExpr && (of.flags & kHintIsComment) == 0)) continue;
    const bool is_signature = out_->exprs[hint].kind == ExprKind::kSignatureHint;
    if (is_signature != (of.kind == StmtKind::kDef)) continue;
    of.hint = hint;
    of.flags |= kHintIsComment;
  }
}

SyntaxReader::Impl::EmbeddedTokens& SyntaxReader::Impl::TokensOfDepth() {
  if (pool_.size() <= pool_depth_) pool_.emplace_back();
  EmbeddedTokens& embedded = pool_[pool_depth_];
  embedded.tokens.clear();
  embedded.ranges.clear();
  return embedded;
}

// The expression that a text is, or none.
ExprId SyntaxReader::Impl::Hint(Text text) {
  if (TooDeep()) return kNoExpr;
  EmbeddedTokens& embedded = TokensOfDepth();
  AppendExpressionTokens(text.data(), text.data() + text.size(), embedded.tokens);
  if (embedded.tokens.empty() || embedded.tokens.front().view() == "ignore") return kNoExpr;
  const Extent before = Now();
  const ExprId hint = Embedded(embedded.tokens, embedded, true);
  if (faults_ == before.faults) return hint;
  GoBack(before);
  return kNoExpr;
}

// Reads tokens of their own, all of which are to be one expression.
ExprId SyntaxReader::Impl::Embedded(TokenSpan tokens, EmbeddedTokens& embedded, bool is_hint) {
  Level level(*this);
  const Place around = place_;
  const bool embeds = embeds_;
  ++pool_depth_;
  place_ = Place();
  embeds_ = true;
  Load(tokens, embedded.framed);
  bool is_signature = false;
  if (is_hint) {
    embedded.hints.clear();
    FindStringHintsOfType({place_.begin, place_.end}, embedded.hints);
    place_.hints = embedded.hints;
    if (Is(tok::LPAR))
      is_signature = std::any_of(place_.begin, place_.end,
                                 [](const Token& token) { return token.code == tok::RARROW && *token.text == '-'; });
  }
  const ExprId whole = is_signature ? Signature() : Expressions();
  if (!AtEnd()) Break(whole);
  --pool_depth_;
  embeds_ = embeds;
  place_ = around;
  return whole;
}

// `(parameters) -> result`.
ExprId SyntaxReader::Impl::Signature() {
  const uint32_t begin = Begin();
  const size_t mark = scratch_.size();
  {
    Level level(*this, tok::LPAR);
    if (!Items(tok::RPAR, tok::ENDMARKER, [this] { Push(StarExpression()); })) Fault();
  }
  if (IsArrow())
    Step();
  else
    Fault();
  Push(Expressions());
  return NodeOf(ExprKind::kSignatureHint, begin, mark);
}

}  // namespace quillet
