// The frame of a complete reading: the significant tokens side by side, the stack of nodes, and what the
// language's tokeniser has to say before any rule is asked.
//
// A failure names a token by its index in the statement, so that it lands where it stands in the file. The
// language reports what its tokeniser rejects in front of what its grammar rejects, wherever the two stand,
// and a bracket that is never closed where the grammar failed behind its line.
#include "parser/complete_parser.h"

#include <algorithm>
#include <cstdio>
#include <utility>

#include "foundations/stop.h"
#include "foundations/utf8.h"
#include "lines/token_search.h"
#include "parser/complete_depth.h"
#include "parser/parser.h"
#include "tokens/token_ends.h"

namespace quillet {

namespace {

constexpr Token kNothing{"", 0, tok::ENDMARKER};
constexpr Token kUnread{"_", 1, tok::NAME};

bool ClosesWith(TokenCode open, TokenCode close) {
  return (open == tok::LPAR && close == tok::RPAR) || (open == tok::LSQB && close == tok::RSQB) ||
         (open == tok::LBRACE && close == tok::RBRACE);
}

// Words that may stand right behind a number, as in `1if x else 2`.
bool MayTouchNumber(TokenCode code) {
  switch (code) {
    case word::kAnd:
    case word::kElse:
    case word::kFor:
    case word::kIf:
    case word::kIn:
    case word::kIs:
    case word::kNot:
    case word::kOr:
      return true;
    default:
      return false;
  }
}

// As the language says it of a character beyond ASCII.
std::string InvalidCharacter(Text text) {
  const DecodedChar decoded = DecodeUtf8(text.data(), text.data() + text.size());
  if (decoded.length == 0) return "invalid character";
  char code[16];
  std::snprintf(code, sizeof code, "U+%04X", static_cast<unsigned>(decoded.code_point));
  return "invalid character '" + std::string(text.substr(0, decoded.length)) + "' (" + code + ")";
}

}  // namespace

CompleteParser::CompleteParser(CNodeFactory& factory, const Grammar& grammar, Version version, bool print_statement)
    : factory_(factory), python3_(version.AtLeast(3, 0)), minor_(version.parts[1]), print_statement_(print_statement) {
  const auto number = [&grammar](const char* name) { return grammar.symbol2number.at(name); };
#define QUILLET_SYMBOL(name) symbols_.name = number(#name);
  QUILLET_SYMBOL(and_expr)
  QUILLET_SYMBOL(and_test)
  QUILLET_SYMBOL(annassign)
  QUILLET_SYMBOL(argument)
  QUILLET_SYMBOL(arglist)
  QUILLET_SYMBOL(arith_expr)
  QUILLET_SYMBOL(assert_stmt)
  QUILLET_SYMBOL(async_stmt)
  QUILLET_SYMBOL(atom)
  QUILLET_SYMBOL(atom_expr)
  QUILLET_SYMBOL(classdef)
  QUILLET_SYMBOL(comp_for)
  QUILLET_SYMBOL(comp_if)
  QUILLET_SYMBOL(comp_op)
  QUILLET_SYMBOL(comparison)
  QUILLET_SYMBOL(decorator)
  QUILLET_SYMBOL(del_stmt)
  QUILLET_SYMBOL(dictorsetmaker)
  QUILLET_SYMBOL(dotted_as_name)
  QUILLET_SYMBOL(dotted_as_names)
  QUILLET_SYMBOL(dotted_name)
  QUILLET_SYMBOL(except_clause)
  QUILLET_SYMBOL(expr)
  QUILLET_SYMBOL(expr_stmt)
  QUILLET_SYMBOL(exprlist)
  QUILLET_SYMBOL(factor)
  QUILLET_SYMBOL(for_stmt)
  QUILLET_SYMBOL(funcdef)
  QUILLET_SYMBOL(global_stmt)
  QUILLET_SYMBOL(if_stmt)
  QUILLET_SYMBOL(import_as_name)
  QUILLET_SYMBOL(import_as_names)
  QUILLET_SYMBOL(import_from)
  QUILLET_SYMBOL(import_name)
  QUILLET_SYMBOL(lambdef)
  QUILLET_SYMBOL(namedexpr_test)
  QUILLET_SYMBOL(nonlocal_stmt)
  QUILLET_SYMBOL(not_test)
  QUILLET_SYMBOL(or_test)
  QUILLET_SYMBOL(parameters)
  QUILLET_SYMBOL(power)
  QUILLET_SYMBOL(raise_stmt)
  QUILLET_SYMBOL(return_stmt)
  QUILLET_SYMBOL(shift_expr)
  QUILLET_SYMBOL(sliceop)
  QUILLET_SYMBOL(star_expr)
  QUILLET_SYMBOL(subscript)
  QUILLET_SYMBOL(subscriptlist)
  QUILLET_SYMBOL(sync_comp_for)
  QUILLET_SYMBOL(term)
  QUILLET_SYMBOL(test)
  QUILLET_SYMBOL(testlist_comp)
  QUILLET_SYMBOL(testlist_star_expr)
  QUILLET_SYMBOL(tfpdef)
  QUILLET_SYMBOL(trailer)
  QUILLET_SYMBOL(try_stmt)
  QUILLET_SYMBOL(typedargslist)
  QUILLET_SYMBOL(varargslist)
  QUILLET_SYMBOL(while_stmt)
  QUILLET_SYMBOL(with_item)
  QUILLET_SYMBOL(with_stmt)
  QUILLET_SYMBOL(xor_expr)
  QUILLET_SYMBOL(yield_arg)
  QUILLET_SYMBOL(yield_expr)
#undef QUILLET_SYMBOL
  for (const Text keyword : python3_ ? Py3Keywords() : Py27Keywords())
    keyword_[CodeOfName(keyword.data(), keyword.size())] = true;
  if (!print_statement_) keyword_[word::kPrint] = false;
}

bool CompleteParser::IsKeyword(TokenCode code) const {
  if (!keyword_[code]) return false;
  if (code != word::kAsync && code != word::kAwait) return true;
  return minor_ >= 7 || (minor_ >= 5 && place_.is_in_async());
}

bool CompleteParser::BeginsExpression(TokenCode code) const {
  switch (code) {
    case tok::NUMBER:
    case tok::STRING:
    case tok::LPAR:
    case tok::LSQB:
    case tok::LBRACE:
    case tok::PLUS:
    case tok::MINUS:
    case tok::TILDE:
    case word::kNot:
    case word::kLambda:
      return true;
    case tok::ELLIPSIS:
    case word::kNone:
    case word::kTrue:
    case word::kFalse:
      return python3_ || code != tok::ELLIPSIS;
    case tok::BACKQUOTE:
      return !python3_;
    case word::kAwait:
      return true;
    default:
      return IsName(code);
  }
}

// ---- tokens ----

void CompleteParser::SetTokens(TokenSpan toks) {
  toks_ = toks;
  index_.clear();
  code_.clear();
  for (size_t i = 0; i < toks.size(); ++i) {
    if (toks[i].removed() || IsSkipCode(toks[i].code)) continue;
    index_.push_back(static_cast<int32_t>(i));
    code_.push_back(toks[i].code);
  }
  // The end of a statement is where its line ends or the comment behind it begins.
  size_t end = index_.empty() ? 0 : static_cast<size_t>(index_.back()) + 1;
  while (end < toks.size() && toks[end].code != tok::COMMENT) ++end;
  index_.push_back(static_cast<int32_t>(end));
  code_.push_back(tok::ENDMARKER);
  ended_.assign(code_.size(), tok::ENDMARKER);
  codes_ = code_.data();
  failed_ = false;
  failure_.reset();
  at_ = 0;
  furthest_ = 0;
  is_trying_ = false;
  met_template_ = false;
  depth_ = 0;
  brackets_ = 0;
  names_ = {};
  captures_ = {};
  in_field_ = false;
  type_scope_ = nullptr;
  in_generic_ = false;
  banned_.clear();
  in_iterable_ = false;
  comprehension_ = nullptr;
  yield_at_ = kNowhere;
  assigned_.clear();
  waits_.clear();
  has_async_for_ = false;
  iterated_.clear();
  irrefutable_words_.clear();
  postponed_.reset();
  judge_ = kNobody;
}

void CompleteParser::CheckTokens() {
  std::vector<int32_t> open;
  for (size_t at = 0; at + 1 < code_.size() && !failed_; ++at) {
    const Token& token = TokenAt(at);
    const TokenCode code = token.code;
    if (IsOpeningBracket(code)) {
      if (static_cast<int>(open.size()) >= kMaxBrackets) return FailAt(at, "too many nested parentheses");
      open.push_back(index_[at]);
    } else if (IsClosingBracket(code)) {
      if (open.empty()) return FailAt(at, "unmatched '" + std::string(token.view()) + "'");
      const Token& opening = toks_[static_cast<size_t>(open.back())];
      if (!ClosesWith(opening.code, code)) {
        return FailAt(at, "closing parenthesis '" + std::string(token.view()) +
                              "' does not match opening parenthesis '" + std::string(opening.view()) + "'" +
                              OnLineOf(open.back(), at));
      }
      open.pop_back();
    } else if (code == tok::NUMBER) {
      CheckNumber(token, index_[at]);
      const Token& next = at + 2 < code_.size() ? TokenAt(at + 1) : kNothing;
      if (!next.removed() && next.text == token.end() && IsNameCode(next.code) && !MayTouchNumber(next.code))
        return FailAt(at, "invalid decimal literal");
    } else if (code == tok::STRING) {
      CheckString(token, index_[at]);
    } else if (code == tok::NAME && token.length <= 3 && code_[at + 1] == tok::STRING && python3_) {
      if (TokenAt(at + 1).text == token.end()) CheckPrefix(token, index_[at]);
    } else if (code == tok::ERRORTOKEN) {
      if (in_field_) return FailAt(at, "f-string: invalid syntax");
      const Text text = token.view();
      const size_t quote = text.find_first_of("\"'");
      if (quote != Text::npos && quote <= 2) {
        const bool is_triple = text.size() >= quote + 3 && IsTripleQuote(text.data() + quote);
        return FailAt(at, std::string("unterminated ") + (is_triple ? "triple-quoted " : "") + "string literal" +
                              DetectedAt(at, is_triple));
      }
      if (static_cast<unsigned char>(text.front()) >= 0x80) return FailAt(at, InvalidCharacter(text));
      return FailAt(at, "invalid syntax");
    }
  }
  for (size_t i = 0; i < toks_.size() && !failed_; ++i) {
    if (toks_[i].code != tok::BACKSLASH || i + 1 >= toks_.size()) continue;
    const char* behind = toks_[i].end();
    if (!IsLineEnd(*behind) && toks_[i].text + 1 == behind)
      return FailAtToken(static_cast<int32_t>(i + 1), "unexpected character after line continuation character");
  }
}

void CompleteParser::CheckNumber(const Token& token, int32_t index) {
  const Text text = token.view();
  if (text.size() == 1) return;
  const char last = static_cast<char>(text.back() | 0x20);
  const bool is_based = text[0] == '0' && IsAsciiLetter(text[1]) && (text[1] | 0x20) != 'e' &&
                        (text[1] | 0x20) != 'j' && (text[1] | 0x20) != 'l';
  if (text.find('_') != Text::npos && !Since(6)) {
    return FailAtToken(index, python3_ ? "Underscores in numeric literals are only supported in Python 3.6 and greater"
                                       : "invalid decimal literal");
  }
  if (!python3_) return;
  if (last == 'l' && !(is_based && (text[1] | 0x20) == 'x')) return FailAtToken(index, "invalid decimal literal");
  if (last == 'l') return FailAtToken(index, "invalid hexadecimal literal");
  if (text[0] == '0' && !is_based && last != 'j' && text.find_first_of(".eE") == Text::npos &&
      text.find_first_not_of("0_") != Text::npos) {
    return FailAtToken(
        index, "leading zeros in decimal integer literals are not permitted; use an 0o prefix for octal integers");
  }
}

// Letters in front of a string that are a prefix each, and none together.
void CompleteParser::CheckPrefix(const Token& token, int32_t index) {
  const auto holds = [&](char letter) {
    return std::ranges::count_if(token.view(), [&](char c) { return (c | 0x20) == letter; }) == 1;
  };
  if (static_cast<size_t>(std::ranges::count_if(Text("ubrft"), holds)) != token.length) return;
  for (const Text pair : {"ub", "ur", "uf", "ut", "bf", "bt", "ft"}) {
    if (!holds(pair[0]) || !holds(pair[1])) continue;
    return FailAtToken(index, std::string("'") + pair[0] + "' and '" + pair[1] + "' prefixes are incompatible");
  }
}

void CompleteParser::CheckString(const Token& token, int32_t index) {
  const Text text = token.view();
  size_t quote = 0;
  bool is_bytes = false;
  bool is_unicode = false;
  bool is_formatted = false;
  for (; quote < text.size() && !IsQuote(text[quote]); ++quote) {
    const char letter = static_cast<char>(text[quote] | 0x20);
    is_bytes |= letter == 'b';
    is_unicode |= letter == 'u';
    is_formatted |= letter == 'f';
  }
  if (is_formatted && !Since(6)) return FailAtToken(index, "invalid syntax");
  if (python3_ && is_unicode && quote > 1) return FailAtToken(index, "'u' and 'r' prefixes are incompatible");
  // `ur` and `br`, and not the other way round.
  if (!python3_ && quote == 2 && (text[0] | 0x20) == 'r') return FailAtToken(index, "invalid syntax");
  if (!python3_ || !is_bytes) return;
  for (const char c : text) {
    if (static_cast<unsigned char>(c) >= 0x80)
      return FailAtToken(index, "bytes can only contain ASCII literal characters");
  }
}

std::string CompleteParser::OnLineOf(int32_t token, size_t at) const {
  if (line_ == nullptr) return {};
  const PositionView positions = line_->positions();
  const int32_t line = positions.LineOf(static_cast<size_t>(token));
  if (line == positions.LineOf(static_cast<size_t>(index_[at]))) return {};
  return " on line " + std::to_string(line_->first_line + line + 1);
}

// A string that does not end is seen to be one at the end of its line, or of the source.
std::string CompleteParser::DetectedAt(size_t at, bool is_triple) const {
  if (line_ == nullptr || !line_->source) return {};
  const std::vector<uint32_t>& starts = line_->source->line_starts;
  int64_t line = line_->first_line + line_->positions().LineOf(static_cast<size_t>(index_[at])) + 1;
  if (is_triple && !starts.empty())
    line = static_cast<int64_t>(starts.size()) - (starts.back() == line_->source->size() ? 1 : 0);
  return " (detected at line " + std::to_string(line) + ")";
}

int32_t CompleteParser::OpenBracket() const {
  std::vector<int32_t> open;
  for (size_t at = 0; at + 1 < code_.size(); ++at) {
    if (IsOpeningBracket(code_[at])) open.push_back(index_[at]);
    if (IsClosingBracket(code_[at]) && !open.empty()) open.pop_back();
  }
  return open.empty() ? -1 : open.back();
}

// ---- failures ----

void CompleteParser::FailAtToken(int32_t token, std::string message) {
  if (failed_) return;
  furthest_ = std::max(furthest_, at_);
  failed_ = true;
  codes_ = ended_.data();
  const bool is_at_end = static_cast<size_t>(token) >= toks_.size();
  failure_.emplace(std::move(message), -1, is_at_end ? kNoText : toks_[static_cast<size_t>(token)].view(),
                   Context::Index(token));
}

void CompleteParser::FailGeneric(size_t at) { FailAt(at, in_field_ ? "f-string: invalid syntax" : kInvalidSyntax); }

void CompleteParser::FailAtNode(const CNode* node, std::string message) {
  if (failed_) return;
  // Brackets that only group belong to no node of the language's own trees.
  while (isa<CAtom>(node) && node->child_count == 3 && node->ChildIs(0, tok::LPAR) &&
         !isa<CTestListStarExpr>(node->children[1]))
    node = node->children[1];
  FailAtToken(FirstTokenOf(node), std::move(message));
}

int32_t CompleteParser::FirstTokenOf(const CNode* node) const {
  while (node->child_count != 0 && node->children[0] != nullptr) node = node->children[0];
  return node->fContext.IsIndex() ? node->fContext.value : static_cast<int32_t>(toks_.size());
}

void CompleteParser::Postpone(size_t at, std::string message, Judge judge) {
  if (failed_ || judge >= judge_) return;
  judge_ = judge;
  postponed_.emplace(std::move(message), -1, kNoText, Context::Index(index_[at]));
}

void CompleteParser::PostponeAtNode(const CNode* node, std::string message, Judge judge) {
  if (failed_ || judge >= judge_) return;
  judge_ = judge;
  postponed_.emplace(std::move(message), -1, kNoText, Context::Index(FirstTokenOf(node)));
}

void CompleteParser::RequireAt(size_t at, int minor, const char* what) {
  if (Since(minor)) return;
  if (!python3_) FailGeneric(at);
  Postpone(at, std::string(what) + " only supported in Python 3." + std::to_string(minor) + " and greater");
}

void CompleteParser::Revive(size_t mark) {
  failed_ = false;
  failure_.reset();
  codes_ = code_.data();
  for (size_t i = mark; i < nodes_.size(); ++i) factory_.pool().Reclaim(nodes_[i]);
  nodes_.resize(mark);
  at_ = 0;
}

// ---- nodes ----

void CompleteParser::PushLeafOf(int type, const Token& token, int32_t index) {
  nodes_.push_back(factory_.ConvertToken(type, token, index));
}

const Token& CompleteParser::TokenAt(size_t at) const {
  const auto index = static_cast<size_t>(index_[at]);
  return index < toks_.size() ? toks_[index] : kNothing;
}

void CompleteParser::PushNothing() { PushLeafOf(tok::NAME, kUnread, 0); }

void CompleteParser::Collapse(size_t mark) {
  for (; nodes_.size() > mark + 1; nodes_.pop_back()) factory_.pool().Reclaim(nodes_.back());
  if (nodes_.size() == mark) PushNothing();
}

void CompleteParser::PushLeaf() {
  if (failed_) return PushNothing();
  const Token& token = TokenAt(at_);
  // The tables make a plain node of the dots, which no place for an expression takes.
  if (token.code == tok::ELLIPSIS) {
    nodes_.push_back(factory_.NewKeywordNode(token.view(), Context::Index(index_[at_])));
  } else {
    PushLeafOf(TypeOfCode(token.code), token, index_[at_]);
  }
  ++at_;
}

bool CompleteParser::Accept(TokenCode code) {
  if (Code() != code) return false;
  PushLeaf();
  return true;
}

void CompleteParser::Expect(TokenCode code, const char* message) {
  if (failed_ || Accept(code)) return;
  if (message != nullptr) Fail(message);
  FailHere();
}

void CompleteParser::PushName() {
  if (!IsName(Code())) FailHere();
  PushLeaf();
}

void CompleteParser::Finish(int symbol, size_t mark) {
  if (failed_) return Collapse(mark);
  const size_t count = nodes_.size() - mark;
  if (count == 1) return;
  CNode* node = factory_.ConvertRule(symbol, nodes_.data() + mark, static_cast<uint32_t>(count));
  nodes_.resize(mark);
  nodes_.push_back(node);
}

template <class Rule>
CNode* CompleteParser::Run(TokenSpan toks, StatementPlace place, Rule&& rule) {
  struct GiveBack {
    CompleteParser& parser;
    ~GiveBack() {
      for (CNode* node : parser.nodes_) parser.factory_.pool().Reclaim(node);
      parser.nodes_.clear();
    }
  } give_back{*this};
  CountSteps(static_cast<int64_t>(toks.size()) + 16);
  place_ = place;
  SetTokens(toks);
  if (AtEnd()) return nullptr;
  rule();
  ExpectEnd();
  if (failed_) {
    ExplainByBracket();
    return nullptr;
  }
  JudgeWaits(0);
  CNode* tree = nodes_.back();
  nodes_.pop_back();
  return tree;
}

// A bracket that is never closed explains what was met on a line below it, or at the end.
void CompleteParser::ExplainByBracket() {
  const int32_t open = OpenBracket();
  if (open < 0) return;
  const bool is_at_end = furthest_ + 1 >= code_.size();
  const Token& bracket = toks_[static_cast<size_t>(open)];
  const char* const end = is_at_end ? nullptr : TokenAt(furthest_).text;
  if (is_at_end || (bracket.text < end && std::any_of(bracket.text, end, IsLineEnd))) {
    failed_ = false;
    FailAtToken(open, "'" + std::string(bracket.view()) + "' was never closed");
  }
}

template <class Rule>
CNode* CompleteParser::RunOrThrow(TokenSpan toks, StatementPlace place, Rule&& rule) {
  CNode* const tree = Run(toks, place, std::forward<Rule>(rule));
  if (failure_) throw ParseError(*failure_);
  return tree;
}

CNode* CompleteParser::ParseStatement(const LogicalLine& line, StatementPlace place) {
  line_ = &line;
  return Run(line.toks, place, [&] {
    CheckTokens();
    if (!failed_) Statement(line.kind);
  });
}

CNode* CompleteParser::ParseField(const LogicalLine& line, StatementPlace place) {
  line_ = &line;
  return RunOrThrow(line.toks, place, [&] {
    in_field_ = true;
    CheckTokens();
    if (Code() == word::kYield)
      Yield();
    else
      StarExpressions(symbols_.testlist_star_expr);
    CheckNoLoneStar(Top());
  });
}

CNode* CompleteParser::ParseHint(TokenSpan toks) {
  line_ = nullptr;
  return RunOrThrow(toks, {}, [&] {
    CheckTokens();
    StarExpressions(symbols_.testlist_star_expr);
  });
}

void CompleteParser::ExpectEnd() {
  if (!AtEnd()) FailHere();
}

CNode* CompleteParser::ParseSignature(TokenSpan toks) {
  line_ = nullptr;
  return RunOrThrow(toks, {}, [&] {
    CheckTokens();
    const size_t mark = Mark();
    if (Code() != tok::LPAR) FailHere();
    Skip();
    if (Code() == tok::ELLIPSIS && CodeAt(1) == tok::RPAR) Skip();
    while (Code() != tok::RPAR) {
      if (Code() == tok::STAR || Code() == tok::DOUBLESTAR) Skip();
      Test();
      if (Code() != tok::COMMA) break;
      Skip();
    }
    if (Code() != tok::RPAR) FailHere();
    Skip();
    if (Code() != tok::RARROW || TokenAt(at_).view() != "->") FailHere();
    Skip();
    Test();
    FinishBare<CNode>(mark);
  });
}

}  // namespace quillet
