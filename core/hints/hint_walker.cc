// Hints of assignments, loops and with-statements: annotations, and the comment at the end of the
// statement; and the finding and parsing of comment hints for all.
//
// A hint is cut out of its comment with a blank for each character in front of it, so that an error
// in it has the column that the comment has. Where a statement has no comment with "type:", no row
// is worked out at all.
#include "hints/hint_walker.h"

#include <algorithm>

#include "foundations/errors.h"
#include "foundations/utf8.h"
#include "lines/syntax_error.h"
#include "lines/type_comment.h"
#include "vocabulary/symbolinfo.h"

namespace quillet {

namespace {

constexpr Text kTypeMark = "type:";
// Trees deeper than this are those that a host tied to themselves.
constexpr int kMaxTreeDepth = 10'000'000;
// Tuples within tuples are unpacked together with their hints to this depth.
constexpr int kMaxTargetDepth = 400;

CTypeHintWalker& Self(CDispatchWalker& walker) { return static_cast<CTypeHintWalker&>(walker); }

using Table = CDispatchWalker::Table;

constexpr Table MakeTable() {
  Table table;
  const auto visit = [&table](NodeKind kind, CDispatchWalker::Visit fn) {
    table[static_cast<size_t>(kind)] = {CDispatchWalker::Action::kVisit, fn};
  };
  visit(NodeKind::kCFuncdefStmt,
        [](CDispatchWalker& walker, CNode* node) { return Self(walker).VisitFuncdefStmt(node); });
  visit(NodeKind::kCExprStmt, [](CDispatchWalker& walker, CNode* node) { return Self(walker).VisitExprStmt(node); });
  visit(NodeKind::kCForStmt, [](CDispatchWalker& walker, CNode* node) { return Self(walker).VisitForStmt(node); });
  visit(NodeKind::kCWithStmt, [](CDispatchWalker& walker, CNode* node) { return Self(walker).VisitWithStmt(node); });
  table[static_cast<size_t>(NodeKind::kCNameLiteral)].action = CDispatchWalker::Action::kPrune;
  return table;
}

// The same for trees that cannot reach a limit, and in which it makes no difference whether the walk
// goes on below the statements: nothing in an expression is of interest.
constexpr Table MakeStatementsOnlyTable() {
  Table table = MakeTable();
  const auto prune = [&table](NodeKind first, NodeKind last) {
    for (size_t kind = static_cast<size_t>(first); kind <= static_cast<size_t>(last); ++kind)
      table[kind].action = CDispatchWalker::Action::kPrune;
  };
  prune(NodeKindRange<CExpression>::kFirst, NodeKindRange<CExpression>::kLast);
  prune(NodeKindRange<CPatternNode>::kFirst, NodeKindRange<CPatternNode>::kLast);
  for (const NodeKind kind :
       {NodeKind::kCDelStmt, NodeKind::kCGlobalStmt, NodeKind::kCNonlocalStmt, NodeKind::kCReturnStmt,
        NodeKind::kCImportNamesStmt, NodeKind::kCFromImportStmt, NodeKind::kCSingleUsedArgumentNode,
        NodeKind::kCUsedArglistNode, NodeKind::kCSingleDecorator, NodeKind::kCExceptClause, NodeKind::kCTrailer})
    prune(kind, kind);
  return table;
}

constexpr Table kStatementsOnly = MakeStatementsOnlyTable();

// A node of two children or more has a leaf that no node above it has, so a tree is at most as deep
// as it has leaves: the line's tokens and, at most, a dozen invented ones.
constexpr size_t kInventedTokens = 16;

// Lines as the host's str.splitlines counts them in a text that holds a line feed; 1 for any other.
int64_t CountLines(Text text) {
  if (text.find('\n') == Text::npos) return 1;
  int64_t count = 0;
  bool open = false;
  for (size_t i = 0; i < text.size(); ++i) {
    const auto c = static_cast<unsigned char>(text[i]);
    size_t length = 0;
    if ((c >= '\n' && c <= '\r') || (c >= 0x1C && c <= 0x1E)) {
      length = c == '\r' && text.substr(i + 1, 1) == "\n" ? 2 : 1;
    } else if (c == 0xC2 && text.substr(i + 1, 1) == "\x85") {
      length = 2;
    } else if (c == 0xE2 && (text.substr(i + 1, 2) == "\x80\xA8" || text.substr(i + 1, 2) == "\x80\xA9")) {
      length = 3;
    }
    open = length == 0;
    if (open) continue;
    ++count;
    i += length - 1;
  }
  return count + (open ? 1 : 0);
}

const CExpression* RequireExpression(const CNode* node) {
  if (!isa<CExpression>(node))
    ThrowError(ErrorKind::kTypeError, std::string("Expected CExpression, got ") + NameOfNodeKind(node->kind));
  return cast<CExpression>(node);
}

}  // namespace

CTypeHintWalker::CTypeHintWalker(std::unique_ptr<CPGenParserImpl> hint_parser, Version version,
                                 CNodeWalker* general_node_walker)
    : CDispatchWalker(MakeTable()),
      hint_conv_(true, true),
      hint_parser_(std::move(hint_parser)),
      version_(version),
      general_node_walker_(general_node_walker) {}

void CTypeHintWalker::Walk(CNode* node, LogicalLine* logical, bool first_in_def) {
  WalkTree(node, logical, first_in_def, /*is_of_line=*/true);
}

void CTypeHintWalker::WalkAnyTree(CNode* node, LogicalLine* logical, bool first_in_def) {
  WalkTree(node, logical, first_in_def, /*is_of_line=*/false);
}

void CTypeHintWalker::CountCommentHints(LogicalLine& logical) {
  const auto holds_mark = [](const Token& token) { return token.view().find(kTypeMark) != Text::npos; };
  std::vector<int32_t> types;
  if (logical.hooks != nullptr && logical.hooks->GetHostTokTypes(logical, types)) [[unlikely]] {
    for (size_t i = 0; i < types.size(); ++i) {
      if (types[i] != tok::COMMENT) continue;
      if (i >= logical.toks.size()) ThrowError(ErrorKind::kIndexError, "tuple index out of range");
      if (logical.toks[i].removed()) ThrowError(ErrorKind::kTypeError, "argument of type 'NoneType' is not iterable");
      fCommentHintCount += holds_mark(logical.toks[i]);
    }
    return;
  }
  if (logical.hooks == nullptr && logical.no_embedded) return;
  for (const Token& token : logical.toks) fCommentHintCount += token.code == tok::COMMENT && holds_mark(token);
}

void CTypeHintWalker::WalkTree(CNode* node, LogicalLine* logical, bool first_in_def, bool is_of_line) {
  struct Reset {
    int32_t& count;
    ~Reset() { count = 0; }
  } reset{fCommentHintCount};
  hint_error_.reset();
  // What reads completely has lines of a cutter, which looked for them.
  if (complete_parser_ == nullptr || !logical->no_embedded) CountCommentHints(*logical);

  if (node != nullptr) {
    const bool is_small =
        complete_parser_ != nullptr ||
        (is_of_line && logical->toks.size() + kInventedTokens <= static_cast<size_t>(fMaxRecurseCount) &&
         fMaxVisits >= 4 * fMaxRecurseCount);
    if (!is_small) return CDispatchWalker::Walk(node, logical, first_in_def);
    return RunWalk(logical, [&] { VisitStatements(node, 1); });
  }
  if (fCommentHintCount == 0) return;

  // A line of comments alone: of interest only as a signature in front of a body.
  struct Idle {
    CTypeHintWalker& walker;
    ~Idle() { walker.fLogical = nullptr; }
  } idle{*this};
  fLogical = logical;
  const Comment comment = FindComment(0, logical);
  std::string hint;
  if (!IsNone(comment.text) && GetHintFromComment(comment.text, hint) && first_in_def)
    ProcessFuncdefComment(hint, comment.tok_i, nullptr, false);
}

void CTypeHintWalker::VisitStatements(CNode* node, int32_t depth) {
  // A parser that a host drives may have made a tree out of all proportion to the line after all.
  if (++fVisitCount > fMaxVisits) [[unlikely]]
    ThrowTooManyVisits();
  if (depth > fMaxRecurseCount) [[unlikely]]
    ThrowTooDeep();
  const Entry& entry = kStatementsOnly[static_cast<size_t>(node->kind)];
  if (entry.action == Action::kPrune) return;
  if (entry.action == Action::kVisit && !entry.visit(*this, node)) return;
  for (CNode* child : node->fChildren()) {
    if (child == nullptr) ThrowError(ErrorKind::kAttributeError, "'NoneType' object has no attribute 'fChildren'");
    if (!child->IsLeaf()) VisitStatements(child, depth + 1);
  }
}

// ---- statements ----

bool CTypeHintWalker::VisitExprStmt(CNode* node) {
  const CExprStmt* stmt = cast<CExprStmt>(node);
  if (const CAnnotatedAssignNode* annotated = stmt->GetAnnotatedAssignNode())
    ProcessNameAndHintNodes(stmt->GetInitialTestExpr(), annotated->GetTypeHintNode(), false);
  if (fCommentHintCount != 0 && stmt->GetEqualCount() != 0) ProcessTarget(node, stmt->GetInitialTestExpr());
  return false;
}

bool CTypeHintWalker::VisitForStmt(CNode* node) {
  if (fCommentHintCount != 0) ProcessTarget(node, cast<CForStmt>(node)->GetTarget());
  return false;
}

// Each item is matched against the one comment at the end of the whole statement.
bool CTypeHintWalker::VisitWithStmt(CNode* node) {
  if (fCommentHintCount == 0) return false;
  const NodeList items = cast<CWithStmt>(node)->GetWithItems();
  if (items.empty()) return false;
  const Hint hint = FindEndingTypeComment(node);
  for (CNode* item : items) ProcessTargetWithHint(hint, cast<CWithItem>(item)->GetTarget());
  return false;
}

void CTypeHintWalker::ProcessTarget(CNode* node, CNode* target) {
  ProcessTargetWithHint(FindEndingTypeComment(node), target);
}

void CTypeHintWalker::ProcessTargetWithHint(const Hint& hint, CNode* target) {
  if (!hint.found) return;
  CNode* hint_node = ParseHint(hint.text, hint.tok_i, true);
  if (hint_node == nullptr) return;
  UseHintTree(hint_node, [&] { ProcessNameAndHintNodes(target, hint_node, false); });
}

void CTypeHintWalker::ProcessNameAndHintNodes(CNode* name_node, CNode* hint_node, bool is_arg) {
  ProcessNameAndHint(name_node, hint_node, is_arg, 0);
}

void CTypeHintWalker::ProcessNameAndHint(CNode* name_node, CNode* hint_node, bool is_arg, int depth) {
  if (name_node == nullptr || hint_node == nullptr) return;
  if (depth > kMaxTargetDepth) ThrowError(ErrorKind::kRecursionError, "maximum recursion depth exceeded");
  const CExpression* name = RequireExpression(name_node);
  const CExpression* hint = RequireExpression(hint_node);
  const int32_t name_count = name->GetSubExprCount();
  const int32_t hint_count = hint->GetSubExprCount();
  if (name_count == 0) {
    TextOptions options;
    options.dotted_name_only = true;
    const Text name_text = name_conv_.TextForNode(name_node, options);
    std::string& info = info_buffer_;
    if (GetHintInfoStr(hint_node, info) && !IsNone(name_text)) AddSymInfo(name_text, info, is_arg);
    return;
  }
  for (int32_t i = 0; i < std::min(name_count, hint_count); ++i)
    ProcessNameAndHint(name->GetSubExpr(i), hint->GetSubExpr(i), is_arg, depth + 1);
}

bool CTypeHintWalker::GetHintInfoStr(CNode* node, std::string& info) {
  if (node == nullptr) return false;
  const Text text =
      isa<CStringLiteral>(node) ? cast<CStringLiteral>(node)->GetStringContents() : hint_conv_.TextForNode(node);
  if (IsNone(text)) return false;
  info.assign(kTypeHintPrefix).append(text);
  return true;
}

void CTypeHintWalker::AddSymInfo(Text name, Text istr, bool is_arg) {
  LogicalLine& logical = RequireLogical();
  // A name that stands in the source is kept as a view, which tells its place.
  if (!logical.source || !logical.source->Holds(name.data())) name = logical.texts().Copy(name);
  istr = logical.texts().Copy(istr);
  if (is_arg)
    logical.AppendStableArgTypeEquiv(name, istr);
  else
    logical.AppendStableTypeEquiv(name, istr);
}

// ---- comments ----

LogicalLine& CTypeHintWalker::RequireLogical() const {
  if (fLogical == nullptr) ThrowError(ErrorKind::kAttributeError, "'NoneType' object has no attribute 'fPositions'");
  return *fLogical;
}

CNodeWalker& CTypeHintWalker::RequireGeneralWalker() const {
  if (general_node_walker_ == nullptr)
    ThrowError(ErrorKind::kAttributeError, "'NoneType' object has no attribute 'Walk'");
  return *general_node_walker_;
}

Text CTypeHintWalker::KeepText(Text text) {
  return fLogical != nullptr ? fLogical->texts().Copy(text) : hint_parser_->factory().pool().Intern(text);
}

CTypeHintWalker::Comment CTypeHintWalker::FindComment(int64_t row, LogicalLine* logical) const {
  const LogicalLine& line = logical != nullptr ? *logical : RequireLogical();
  const PositionView positions = line.positions();
  const size_t count =
      std::min({static_cast<size_t>(std::max(line.token_count, 0)), line.toks.size(), positions.size()});
  for (size_t i = 0; i < count; ++i) {
    const int64_t tok_row = positions.LineOf(i);
    if (tok_row > row) break;
    const Text text = line.toks[i].view();
    if (tok_row == row && text.starts_with('#')) return {text, static_cast<int32_t>(i)};
  }
  return {};
}

std::pair<int64_t, int64_t> CTypeHintWalker::GetRowRange(CNode* node) const {
  const auto edge_leaf = [](CNode* at, bool is_last) {
    for (int depth = 0; !at->IsLeaf(); ++depth) {
      if (depth > kMaxTreeDepth) ThrowError(ErrorKind::kRecursionError, "maximum recursion depth exceeded");
      CNode* child = is_last ? at->ChildAt(-1) : at->ChildAt(0);
      if (child == nullptr) ThrowError(ErrorKind::kAttributeError, "'NoneType' object has no attribute 'fText'");
      at = child;
    }
    return at;
  };
  const auto first_row = [this](const CNode* leaf) -> int64_t {
    if (leaf->fContext.IsPosition()) return leaf->fContext.position().line;
    if (!leaf->fContext.IsIndex()) ThrowError(ErrorKind::kTypeError, "the context is no token index");
    const LogicalLine& line = RequireLogical();
    const PositionView positions = line.positions();
    const int64_t size = static_cast<int64_t>(positions.size());
    int64_t index = std::min(leaf->fContext.value, line.token_count - 1);
    if (index < 0) index += size;
    if (index < 0 || index >= size) ThrowError(ErrorKind::kIndexError, "list index out of range");
    return positions.LineOf(static_cast<size_t>(index));
  };
  const CNode* last = edge_leaf(node, true);
  return {first_row(edge_leaf(node, false)), first_row(last) + CountLines(last->fText())};
}

CTypeHintWalker::Hint CTypeHintWalker::FindEndingTypeComment(CNode* node) const {
  Hint hint;
  if (fCommentHintCount == 0) return hint;
  const Comment comment = FindComment(GetRowRange(node).second - 1);
  if (IsNone(comment.text)) return hint;
  hint.tok_i = comment.tok_i;
  hint.found = GetHintFromComment(comment.text, hint.text);
  return hint;
}

bool CTypeHintWalker::GetHintFromComment(Text comment, std::string& hint) {
  const TypeCommentHint place = FindTypeCommentHint(comment);
  if (!place.found) return false;
  hint.clear();
  if (place.begin == place.end) return true;
  hint.assign(CharCountOfUtf8(comment.substr(0, place.begin)), ' ');
  hint.append(comment.substr(place.begin, place.end - place.begin));
  return true;
}

CNode* CTypeHintWalker::ParseHint(Text hint, int32_t tok_i, bool call_general_node_walker) {
  if (complete_parser_ != nullptr) return ParseHintCompletely(hint, tok_i, call_general_node_walker);
  if (!hint_source_)
    hint_source_ = SourceText::Copy(hint);
  else
    hint_source_->Assign(hint);
  hint_rows_.clear();
  CutLines(*hint_source_, version_, hint_rows_);
  if (hint_rows_.size() != 1) return nullptr;

  LogicalLine line;
  SetFromRow(line, hint_source_, hint_rows_.front());
  std::vector<Position> positions;
  positions.reserve(line.toks.size());
  for (const Token& token : line.toks) {
    Position position = hint_source_->PositionOf(token.text);
    position.line -= line.first_line;
    positions.push_back(position);
  }
  // The source serves the next hint soon; what the tree and the records refer to must stay.
  const Text kept = KeepText(hint);
  for (Token& token : hint_source_->tokens) token.text = kept.data() + (token.text - hint_source_->begin());
  line.SetPositions(std::move(positions));

  CNode* node = nullptr;
  try {
    node = hint_parser_->ParseToNode(line, false);
  } catch (const ParseError& error) {
    const PositionView places = line.positions();
    int64_t col = 0;
    if (error.context.IsPosition()) {
      col = error.context.position().col;
    } else if (error.context.IsIndex() && static_cast<size_t>(error.context.value) < places.size()) {
      col = places[static_cast<size_t>(error.context.value)].col;
    } else if (places.size() > 0) {
      // Behind the last token.
      col = places[places.size() - 1].col + static_cast<int64_t>(line.toks.back().length);
    }
    RaiseHintSyntaxError(tok_i, col);
  }
  if (!call_general_node_walker) return node;
  try {
    RequireGeneralWalker().Walk(node, fLogical);
  } catch (...) {
    if (node != nullptr) hint_parser_->DiscardNode(node);
    throw;
  }
  return node;
}

void CTypeHintWalker::RaiseHintSyntaxError(int32_t tok_i, int64_t utf8_offset_in_hint) {
  const Position in_token{0, static_cast<int32_t>(utf8_offset_in_hint)};
  throw CreateSyntaxError("invalid syntax", RequireLogical(), Context::Index(tok_i), &in_token);
}

bool CTypeHintWalker::IsDottedName(Text text) {
  bool in_name = false;
  for (size_t at = 0; at < text.size();) {
    const DecodedChar c = DecodeUtf8(text.data() + at, text.data() + text.size());
    if (c.length == 0) return false;
    at += c.length;
    if (c.code_point == '_') {
      in_name = true;
    } else if (in_name) {
      if (c.code_point == '.')
        in_name = false;
      else if ((CharClassOf(c.code_point) & kCharAlnum) == 0)
        return false;
    } else {
      if ((CharClassOf(c.code_point) & kCharAlpha) == 0) return false;
      in_name = true;
    }
  }
  return true;
}

}  // namespace quillet
