// Looks backwards from a declaration to the head of its function, on from there to its end, and outwards.
#include "analysis/name_doubts.h"

#include <algorithm>

#include "lines/token_search.h"
#include "lines/unusual_tokens.h"

namespace quillet {

namespace {

class NameDoubts {
 public:
  NameDoubts(const FileAnalyzer& analyzed, std::span<const uint32_t> declarations)
      : source_(analyzed.source()),
        rows_(analyzed.rows()),
        results_(analyzed.results()),
        declarations_(declarations),
        budget_(kLooksAToken * source_.tokens.size()) {}

  // What looks at the same tokens again and again is not worth it either.
  bool is_exhausted() const { return budget_ == 0; }

  bool MayBeWrong(size_t declaration) {
    const size_t head = HeadAround(declaration);
    if (head == kNone) return true;
    const TokenSpan toks = TokensOf(declaration);
    size_t at = 0;
    while (at < toks.size() && !IsDeclaring(toks[at].code)) ++at;
    // Its own name is not in its scope.
    const size_t name_end = rows_[head].first_token + (rows_[head].is_async ? size_t{3} : size_t{2});
    // Nor do declarations like this one matter.
    size_t first = head + 1;
    while (IsDeclaring(toks[0].code) && first < declaration &&
           (IsSilent(first) || TokensOf(first)[0].code == toks[0].code))
      ++first;
    const TokenSpan head_toks = Between(std::min(name_end, EndOf(head)), EndOf(head));
    const TokenSpan in_front = Between(rows_[first].first_token, rows_[declaration].first_token + at);
    const bool is_nonlocal = at < toks.size() && toks[at].code == word::kNonlocal;
    for (size_t i = at; i < toks.size() && !is_exhausted(); ++i) {
      if (toks[i].code != tok::NAME) {
        // Another statement on the same row, or a word that is a name here.
        if (i > at && toks[i].code != tok::COMMA && !IsSkipCode(toks[i].code)) return true;
        continue;
      }
      const Text name = toks[i].view();
      if (!IsAscii(name) || Holds(head_toks, name) || Holds(in_front, name) || MayBeEmbedded(head, declaration, name) ||
          IsAnnotatedBehind(declaration, head, name))
        return true;
      if (is_nonlocal && !IsBoundAround(head, name)) return true;
    }
    return false;
  }

  // Whether a function yields and returns a value.
  bool MayReturnWhatItYields(size_t head) {
    bool yields = false, returns = false;
    for (size_t i = head + 1; IsWithin(i, head); ++i) {
      if ((rows_[i].unusual & kYieldOrReturn) == 0 || results_[i].depth != results_[head].depth + 1) continue;
      const TokenSpan toks = TokensOf(i);
      for (size_t k = 0; k < toks.size(); ++k) {
        yields |= toks[k].code == word::kYield;
        returns |= toks[k].code == word::kReturn && NextSignificant(toks, k + 1, toks.size()) < toks.size();
      }
    }
    return yields && returns;
  }

  // Whether a function that is nested in the one around the row, or a lambda or comprehension in it, uses a name that
  // the row deletes.
  bool MayDeleteUsed(size_t row) {
    const size_t head = HeadAround(row);
    if (head == kNone) return false;
    const TokenSpan toks = TokensOf(row);
    for (size_t i = 1; i < toks.size(); ++i) {
      if (toks[i].code != tok::NAME || toks[i - 1].code == tok::DOT) continue;
      for (size_t other = head + 1; IsWithin(other, head); ++other) {
        if (rows_[other].token_count == 0) continue;
        const TokenSpan others = TokensOf(other);
        Spend(others.size());
        const bool is_nested = results_[other].depth > results_[row].depth ||
                               std::any_of(others.begin() + 1, others.end(), [](const Token& token) {
                                 return token.code == word::kLambda || token.code == word::kFor;
                               });
        if (is_nested && (!rows_[other].no_embedded || Holds(others, toks[i].view()))) return true;
      }
    }
    return false;
  }

 private:
  static constexpr size_t kNone = SIZE_MAX;
  static constexpr size_t kLooksAToken = 4;
  // What the rows say that hold either.
  static constexpr uint8_t kYieldOrReturn = UnusualTokens::kReturn | UnusualTokens::kYield;

  static bool IsDeclaring(TokenCode code) { return code == word::kGlobal || code == word::kNonlocal; }
  static bool IsAscii(Text name) {
    return std::ranges::none_of(name, [](char c) { return static_cast<unsigned char>(c) >= 0x80; });
  }
  bool Holds(TokenSpan toks, Text name) {
    Spend(toks.size());
    for (size_t i = 0; i < toks.size(); ++i) {
      if (toks[i].code == tok::NAME && toks[i].view() == name && (i == 0 || toks[i - 1].code != tok::DOT)) return true;
    }
    return false;
  }

  TokenSpan TokensOf(size_t row) const { return Between(rows_[row].first_token, EndOf(row)); }
  TokenSpan Between(size_t begin, size_t end) const { return TokenSpan(source_.tokens).subspan(begin, end - begin); }
  size_t EndOf(size_t row) const { return size_t{rows_[row].first_token} + rows_[row].token_count; }
  bool IsSilent(size_t row) const {
    return rows_[row].kind == LineKind::kBlankLine || rows_[row].kind == LineKind::kComment;
  }
  // Whether the row behind a head stands in its body; in the end none does.
  bool IsWithin(size_t row, size_t head) {
    Spend(1);
    return row < rows_.size() && !is_exhausted() && (IsSilent(row) || results_[row].depth > results_[head].depth);
  }
  void Spend(size_t looks) { budget_ -= std::min(budget_, looks); }

  // Of the definition that the row stands in directly, or kNone.
  size_t HeadAround(size_t row) {
    const uint32_t depth = results_[row].depth;
    if (depth == 0) return kNone;
    for (size_t i = row; i-- > 0;) {
      Spend(1);
      const bool is_definition = rows_[i].kind == LineKind::kFunctionDef || rows_[i].kind == LineKind::kClassDef;
      if (is_definition && results_[i].depth + 1 == depth) return i;
    }
    return kNone;
  }

  // What stands in a string is no token here.
  bool MayBeEmbedded(size_t head, size_t row, Text name) {
    Spend(row - head);
    for (size_t i = head; i <= row; ++i) {
      if (rows_[i].no_embedded || rows_[i].token_count == 0) continue;
      const TokenSpan toks = TokensOf(i);
      Spend(toks.size());
      if (std::ranges::any_of(toks, [&](const Token& token) {
            return (token.code == tok::STRING || token.code == tok::COMMENT) && token.view().find(name) != Text::npos;
          }))
        return true;
    }
    return false;
  }

  bool IsAnnotatedBehind(size_t row, size_t head, Text name) {
    for (size_t i = row + 1; IsWithin(i, head); ++i) {
      if (rows_[i].kind != LineKind::kAssignment) continue;
      const TokenSpan toks = TokensOf(i);
      if (toks.size() > 1 && toks[1].code == tok::COLON && toks[0].view() == name) return true;
    }
    return false;
  }

  bool IsBoundAround(size_t head, Text name) {
    for (size_t around = HeadAround(head); around != kNone && !is_exhausted(); around = HeadAround(around)) {
      // Type parameters have a scope of their own.
      const TokenSpan toks = TokensOf(around);
      if (std::ranges::any_of(toks.first(std::min<size_t>(toks.size(), 4)),
                              [](const Token& token) { return token.code == tok::LSQB; }))
        return false;
      if (rows_[around].kind == LineKind::kFunctionDef && (IsParameter(toks, name) || IsAssignedIn(around, name)))
        return !IsGlobalSomewhere(name);
    }
    return false;
  }

  static bool IsParameter(TokenSpan head, Text name) {
    size_t depth = 0;
    for (size_t i = 0; i < head.size(); ++i) {
      const TokenCode code = head[i].code;
      depth += IsOpeningBracket(code);
      if (IsClosingBracket(code) && --depth == 0) return false;
      if (depth != 1 || code != tok::NAME || head[i].view() != name) continue;
      switch (head[i - 1].code) {
        case tok::LPAR:
        case tok::COMMA:
        case tok::STAR:
        case tok::DOUBLESTAR:
          return true;
        default:
          break;
      }
    }
    return false;
  }

  bool IsAssignedIn(size_t head, Text name) {
    for (size_t i = head + 1; IsWithin(i, head); ++i) {
      if (rows_[i].kind != LineKind::kAssignment || results_[i].depth != results_[head].depth + 1) continue;
      const TokenSpan toks = TokensOf(i);
      for (size_t k = 0; k + 2 < toks.size() && toks[k + 1].code == tok::EQUAL; k += 2)
        if (toks[k].view() == name) return true;
    }
    return false;
  }

  bool IsGlobalSomewhere(Text name) {
    return std::ranges::any_of(declarations_, [&](uint32_t row) {
      const TokenSpan toks = TokensOf(row);
      return std::ranges::any_of(toks, [](const Token& token) { return token.code == word::kGlobal; }) &&
             Holds(toks, name);
    });
  }

  const SourceText& source_;
  std::span<const LineRow> rows_;
  std::span<const FileAnalyzer::LineResult> results_;
  std::span<const uint32_t> declarations_;
  size_t budget_;
};

// Of 2.7, where more of a function is settled when it is compiled.
bool MayMisuseNamesOf2(const FileAnalyzer& analyzed, NameDoubts& doubts) {
  const std::span<const LineRow> rows = analyzed.rows();
  for (size_t i = 0; i < rows.size(); ++i) {
    const LineRow& row = rows[i];
    const auto toks = [&] { return TokenSpan(analyzed.source().tokens).subspan(row.first_token, row.token_count); };
    switch (row.kind) {
      case LineKind::kDelete:
        if (doubts.MayDeleteUsed(i)) return true;
        break;
      case LineKind::kFromImport:
        if (row.indent > 0 && std::ranges::any_of(toks(), [](const Token& token) { return token.code == tok::STAR; }))
          return true;
        break;
      case LineKind::kUnknown:
        if (toks()[0].code == word::kExec) return true;
        break;
      case LineKind::kFunctionDef:
        if (doubts.MayReturnWhatItYields(i)) return true;
        break;
      default:
        break;
    }
  }
  return false;
}

}  // namespace

bool MayMisuseNames(const FileAnalyzer& analyzed, Version version, std::span<const uint32_t> declarations,
                    bool has_async_definitions) {
  NameDoubts doubts(analyzed, declarations);
  if (std::ranges::any_of(declarations, [&](uint32_t row) { return doubts.MayBeWrong(row); })) return true;
  if (!version.AtLeast(3, 0)) return MayMisuseNamesOf2(analyzed, doubts) || doubts.is_exhausted();
  const std::span<const LineRow> rows = analyzed.rows();
  for (size_t i = 0; has_async_definitions && i < rows.size(); ++i) {
    if (rows[i].is_async && rows[i].kind == LineKind::kFunctionDef && doubts.MayReturnWhatItYields(i)) return true;
  }
  return doubts.is_exhausted();
}

}  // namespace quillet
