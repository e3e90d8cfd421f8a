// Which statements that begin with the names "match" and "case" are the statements of these names.
//
// Everything hangs on the head's colon: the first ":" outside brackets that no `lambda` outside
// brackets has taken. Without one, or with nothing in front of it, the name is a name.
//
// `match` has nothing behind its colon, and no ordinary statement ends with a colon (what follows an
// annotation's or a lambda's is never empty). So a colon that is not the last token makes the
// statement an annotation, as in `match.x: int`.
//
// `case` may have its body on the line. The only ordinary statement with such a colon is the
// annotation of a target, and a target that begins with a name is that name and trailers, the last
// of them an attribute or a subscript:  case.x: T   case(y).x: T   case[y][z]: T.  A pattern is none
// of these but for one form, `case [x]: y`, which is both a sequence pattern with a body and a
// subscript with an annotation. It is a statement where what follows cannot be an annotation (it
// begins with a word that begins statements, is a tuple, has an annotation of its own, or assigns more
// than once or with an operation) or where the brackets are empty; what is left is settled as it is
// written: a subscript's bracket touches its name, a pattern's does not.
#include <algorithm>

#include "lines/logical_line.h"
#include "lines/token_search.h"
#include "tokens/operators.h"

namespace quillet {

namespace {

class SoftKeywordStatement {
 public:
  SoftKeywordStatement(TokenSpan toks, size_t start, size_t end) : toks_(toks), end_(std::min(end, toks.size())) {
    word_ = Significant(start);
  }

  LineKind Kind() const {
    if (word_ >= end_) return LineKind::kUnknown;
    const TokenCode code = toks_[word_].code;
    if (code != word::kMatch && code != word::kCase) return LineKind::kUnknown;
    const size_t first = Significant(word_ + 1);
    const size_t colon = HeadColon(toks_, first, end_);
    if (colon >= end_ || colon == first) return LineKind::kUnknown;
    const size_t body = Significant(colon + 1);
    if (body >= end_) return code == word::kMatch ? LineKind::kMatch : LineKind::kCase;
    if (code == word::kMatch || IsAnnotation(first, colon, body)) return LineKind::kUnknown;
    return LineKind::kCase;
  }

 private:
  size_t Significant(size_t i) const { return NextSignificant(toks_, i, end_); }

  // Whether the tokens from `first` up to the colon are trailers that, with the name in front, make
  // a target, and those from `body` on can be its annotation.
  bool IsAnnotation(size_t first, size_t colon, size_t body) const {
    bool target = false;
    size_t trailers = 0;
    for (size_t i = first; i < colon; ++trailers) {
      switch (toks_[i].code) {
        case tok::DOT:
          i = Significant(i + 1);
          if (!IsNameCode(toks_[i].code)) return false;
          i = Significant(i + 1);
          target = true;
          break;
        case tok::LSQB:
        case tok::LPAR:
          target = toks_[i].code == tok::LSQB;
          i = Significant(BehindBracket(toks_, i, end_));
          break;
        default:
          return false;
      }
    }
    if (!target) return false;
    if (trailers > 1 || toks_[first].code == tok::DOT) return true;
    const bool is_empty = toks_[Significant(first + 1)].code == tok::RSQB;
    return !is_empty && CanBeAnnotation(body) && toks_[word_].end() == toks_[first].text;
  }

  // An expression, with at most one "=" behind it.
  bool CanBeAnnotation(size_t body) const {
    const TokenCode begin = toks_[body].code;
    if (OnlyBeginsStatement(begin) || begin == word::kFrom || begin == word::kNonlocal || begin == word::kYield ||
        begin == tok::STAR) {
      return false;
    }
    size_t assignments = 0;
    bool is_statement = false;
    VisitOwnTokens(toks_, body, end_, [&](size_t i) {
      const TokenCode code = toks_[i].code;
      if (code == tok::EQUAL) {
        ++assignments;
      } else if (IsAssignment(code) || code == tok::COLON || (code == tok::COMMA && assignments == 0)) {
        is_statement = true;
      }
      return !is_statement;
    });
    return assignments <= 1 && !is_statement;
  }

  TokenSpan toks_;
  size_t end_;
  size_t word_;
};

}  // namespace

LineKind FindMatchOrCaseType(TokenSpan toks, size_t start, size_t end) {
  return SoftKeywordStatement(toks, start, end).Kind();
}

}  // namespace quillet
