// From a node to its text: a descent that appends to one buffer, with views wherever they will do.
//
// A text begins as a view of its first token. A token that begins where the last one ended makes the
// view longer; the first that does not moves the text to the end of the buffer. Children of a
// compound node are rendered one behind the other and joined; the joined text takes their place. A
// node that has no text in the mode asked for ends the descent at once, except inside the brackets
// of a trailer, where it is dropped and the text goes back to what it was in front of it.

#include "text/node_to_text.h"

#include <array>
#include <cstring>

#include "foundations/char_tables.h"
#include "foundations/utf8.h"
#include "vocabulary/symbolinfo.h"

namespace quillet {
namespace {

bool IsLiteralNameCode(TokenCode code) { return code == word::kNone || code == word::kTrue || code == word::kFalse; }

// ASCII characters that a string may hold and keep its contents.
constexpr std::array<bool, 128> kHarmless = [] {
  std::array<bool, 128> table{};
  for (int c = '0'; c <= '9'; ++c) table[c] = true;
  for (int c = 'a'; c <= 'z'; ++c) table[c] = true;
  for (int c = 'A'; c <= 'Z'; ++c) table[c] = true;
  for (const unsigned char c : {' ', '"', '\'', ',', '.', '_'}) table[c] = true;
  return table;
}();

bool AllStringLiterals(std::span<CNode* const> nodes) {
  for (const CNode* node : nodes) {
    if (!isa<CStringLiteral>(node)) return false;
  }
  return true;
}

}  // namespace

// ---- the text under construction ----

void CNodeToTextConverter::Begin() {
  // A call that ended in an exception may have left something.
  depth_ = 0;
  buffer_.clear();
  pieces_.clear();
}

void CNodeToTextConverter::Compose(Run& run) {
  if (run.composed) return;
  run.offset = buffer_.size();
  if (run.view != nullptr) buffer_.append(run.view, run.view_size);
  run.composed = true;
}

void CNodeToTextConverter::AppendApart(Run& run, Text piece) {
  if (run.view == nullptr && !run.composed) {
    run.view = piece.data();
    run.view_size = piece.size();
    return;
  }
  Compose(run);
  buffer_.append(piece);
}

Text CNodeToTextConverter::TextOf(const Run& run) const {
  if (!run.composed) return {run.view, run.view_size};
  return Text(buffer_).substr(run.offset);
}

// ---- entry points ----

Text CNodeToTextConverter::Render(CNode* node, TextOptions options) {
  Begin();
  Run run;
  return AppendNode(run, node, options) ? TextOf(run) : kNoText;
}

Text CNodeToTextConverter::TextForAtomPlusTrailers(CNode* atom, std::span<CNode* const> trailers, TextOptions options) {
  Begin();
  Run run;
  return AppendChain(run, atom, trailers, options) ? TextOf(run) : kNoText;
}

Text CNodeToTextConverter::TextForTrailer(CTrailer* trailer) {
  Begin();
  Run run;
  AppendTrailer(run, trailer, /*dotted_name_only=*/false, /*literal_only=*/false);
  // A dot in front of a keyword adds nothing.
  return run.view == nullptr && !run.composed ? Text("") : TextOf(run);
}

bool CNodeToTextConverter::ShowsContentsOf(Text text) {
  const char* at = text.data();
  const char* const end = at + text.size();
  while (at < end) {
    const auto byte = static_cast<unsigned char>(*at);
    if (byte < 0x80) {
      if (!kHarmless[byte]) return false;
      ++at;
      continue;
    }
    const DecodedChar decoded = DecodeUtf8(at, end);
    if (decoded.length == 0 || (CharClassOf(decoded.code_point) & kCharAlnum) == 0) return false;
    at += decoded.length;
  }
  return true;
}

Text CNodeToTextConverter::TextForStringLiteral(const CStringLiteral* node) const {
  // Without contents only the one distinction is shown: a bytes literal reads as a plain one. That
  // is meant.
  if (!include_string_contents_) return node->IsUnicode() ? "u''" : "''";
  // Only what would be escaped is encoded differently, and no harmless character is.
  if (ShowsContentsOf(node->fText())) return node->fText();
  return node->IsBytes() ? "b''" : node->IsUnicode() ? "u''" : "''";
}

// ---- the descent ----

inline bool CNodeToTextConverter::AppendNode(Run& run, CNode* node, TextOptions options) {
  if (node == nullptr) ThrowNoAttribute("fText");
  if (node->IsLeaf()) return AppendLeaf(run, node, options);
  if (++depth_ > kMaxDepth) {
    ThrowError(ErrorKind::kRecursionError, "maximum recursion depth exceeded while rendering a node");
  }
  const bool has_text = AppendInterior(run, node, options);
  --depth_;
  return has_text;
}

inline bool CNodeToTextConverter::AppendLeaf(Run& run, const CNode* leaf, TextOptions options) {
  const bool is_name = isa<CNameLiteral>(leaf);
  if (options.dotted_name_only && !is_name) return false;
  // A bare name is no literal, but the three words are, where they are names.
  if (options.literal_only && is_name && !IsLiteralNameCode(leaf->code)) return false;
  const auto* string = dyn_cast<CStringLiteral>(leaf);
  Append(run, string != nullptr ? TextForStringLiteral(string) : leaf->fText());
  return true;
}

bool CNodeToTextConverter::AppendInterior(Run& run, CNode* node, TextOptions options) {
  if (options.discard_simple_parens && node->kind == NodeKind::kCAtom) {
    node = DropSimpleParens(node);
    if (node == nullptr) ThrowNoAttribute("fText");
    if (node->IsLeaf()) return AppendLeaf(run, node, options);
  }
  if (auto* atom_expr = dyn_cast<CAtomExpr>(node)) {
    return AppendChain(run, atom_expr->GetAtom(), atom_expr->TrailerSpan(), options);
  }
  if (auto* power = dyn_cast<CPower>(node)) {
    // Without it, the exponent of a power plays no part.
    CNode* const exponent = shows_exponents_ ? power->GetExponentNode() : nullptr;
    if (exponent != nullptr) return AppendPower(run, power, exponent, options);
    return AppendChain(run, power->GetAtom(), power->TrailerSpan(), options);
  }
  if (options.dotted_name_only) return false;

  if (auto* atom = dyn_cast<CAtom>(node)) {
    const Text bracket = atom->GetInitialBracket();
    if (!include_bracket_text_ && (bracket == "{" || bracket == "[")) {
      Append(run, bracket == "{" ? "{}" : "[]");
      return true;
    }
    // Adjacent strings are one literal, of which the first is shown.
    if (AllStringLiterals(atom->fChildren())) {
      Append(run, TextForStringLiteral(cast<CStringLiteral>(atom->children[0])));
      return true;
    }
    if (bracket == "(" && atom->ChildCount() == 2 && atom->ChildIs(1, tok::RPAR)) {
      if (!include_bracket_text_) return false;
      Append(run, "( )");
      return true;
    }
  }
  if (!include_bracket_text_) return false;
  return AppendCompound(run, node, options);
}

bool CNodeToTextConverter::AppendCompound(Run& run, CNode* node, TextOptions options) {
  if (!node->has_children) ThrowNoSuchChild(node);
  const size_t first_piece = pieces_.size();
  const size_t buffer_size = buffer_.size();
  // What stands around a child is joined to it, so its own parentheses stay.
  const TextOptions child_options{.discard_simple_parens = false, .literal_only = options.literal_only};
  for (CNode* child : node->fChildren()) {
    Run child_run;
    if (!AppendNode(child_run, child, child_options)) return false;
    const TokenCode code = child->IsLeaf() ? child->code : tok::ERRORTOKEN;
    if (child_run.composed) {
      pieces_.push_back({nullptr, child_run.offset, buffer_.size() - child_run.offset, code});
    } else {
      pieces_.push_back({child_run.view, 0, child_run.view_size, code});
    }
  }

  texts_.clear();
  codes_.clear();
  // Whether the pieces stand in the source in this order, at most one character apart.
  bool side_by_side = pieces_.size() > first_piece;
  const char* end = nullptr;
  for (size_t i = first_piece; i < pieces_.size(); ++i) {
    const Piece& piece = pieces_[i];
    const bool follows = end == nullptr || piece.view == end || piece.view == end + 1;
    side_by_side = side_by_side && piece.view != nullptr && follows;
    texts_.push_back({piece.view != nullptr ? piece.view : buffer_.data() + piece.offset, piece.size});
    codes_.push_back(piece.code);
    end = texts_.back().data() + piece.size;
  }
  joined_.clear();
  AppendJoinedTokens(texts_.data(), codes_.data(), texts_.size(), joined_);
  pieces_.resize(first_piece);
  buffer_.resize(buffer_size);

  const bool add_parens = options.add_parens_if_operator && texts_.size() != 1;
  if (add_parens) Append(run, "(");
  if (side_by_side && joined_ == Text(texts_.front().data(), static_cast<size_t>(end - texts_.front().data()))) {
    Append(run, {texts_.front().data(), joined_.size()});
  } else {
    Compose(run);
    buffer_.append(joined_);
  }
  if (add_parens) Append(run, ")");
  return true;
}

bool CNodeToTextConverter::AppendChain(Run& run, CNode* atom, std::span<CNode* const> trailers, TextOptions options) {
  // Parentheses in front of a trailer stay: (a).b.
  const TextOptions atom_options{.dotted_name_only = options.dotted_name_only,
                                 .discard_simple_parens = options.discard_simple_parens && trailers.empty(),
                                 .literal_only = options.literal_only};
  if (!AppendNode(run, atom, atom_options)) return false;
  for (CNode* trailer : trailers) {
    if (!AppendTrailer(run, trailer, options.dotted_name_only, options.literal_only)) return false;
  }
  return true;
}

bool CNodeToTextConverter::AppendPower(Run& run, CPower* power, CNode* exponent, TextOptions options) {
  if (options.dotted_name_only || !include_bracket_text_) return false;
  const TextOptions part_options{.discard_simple_parens = false, .literal_only = options.literal_only};
  if (options.add_parens_if_operator) Append(run, "(");
  if (!AppendChain(run, power->GetAtom(), power->TrailerSpan(), part_options)) return false;
  Append(run, " ** ");
  if (!AppendNode(run, exponent, part_options)) return false;
  if (options.add_parens_if_operator) Append(run, ")");
  return true;
}

bool CNodeToTextConverter::AppendTrailer(Run& run, CNode* node, bool dotted_name_only, bool literal_only) {
  const auto* trailer = Expect<CTrailer>(node);
  if (trailer == nullptr) ThrowNoAttribute("GetInitialToken");
  if (trailer->child_count == 0) (void)trailer->GetInitialToken();
  const CNode* const first = trailer->children[0];
  if (first == nullptr) ThrowNoAttribute("fText");
  if (dotted_name_only && first->code != tok::DOT) return false;
  if (first->code == tok::DOT) {
    if (literal_only) return false;
    const Text name = trailer->GetDotName();
    if (IsNone(name)) return true;
    Append(run, first->fText());
    Append(run, name);
    return true;
  }
  const bool is_call = first->code == tok::LPAR;
  if (!is_call && first->code != tok::LSQB) ThrowError(ErrorKind::kValueError, "Bad trailer node");

  Append(run, first->fText());
  if (is_call ? include_arg_text_ : include_bracket_text_) {
    if (CNode* nested = trailer->GetNestedNode()) AppendTrailerContents(run, nested, literal_only);
  }
  const CNode* const last = trailer->LastChild();
  const bool is_closed = last != nullptr && last->code == (is_call ? tok::RPAR : tok::RSQB);
  Append(run, is_closed ? last->fText() : is_call ? Text(")") : Text("]"));
  return true;
}

void CNodeToTextConverter::AppendTrailerContents(Run& run, CNode* nested, bool literal_only) {
  const Run run_before = run;
  const size_t buffer_size = buffer_.size();
  const size_t piece_count = pieces_.size();
  const int depth = depth_;
  // Inside brackets "only literals" means "only dotted names"; that is meant.
  if (AppendNode(run, nested, {.dotted_name_only = literal_only})) return;
  // What has no text is dropped, and the brackets stay empty.
  run = run_before;
  buffer_.resize(buffer_size);
  pieces_.resize(piece_count);
  depth_ = depth;
}

}  // namespace quillet
