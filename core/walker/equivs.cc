// The equivalent of an expression: a short text from which a later stage can work out its type.
//
// It is a typed literal (":l:int: 1"), the source text of a name, call or subscript, the text of an
// operator expression behind kExpressionEquivPrefix, or none. Nothing is evaluated. A trailer asks
// for a part of the value, f()[0]; what has no text of its own to put it behind has none then. The
// order of the tests decides, and the only descent is through parentheses, in a loop.

#include <string>

#include "vocabulary/symbolinfo.h"
#include "walker/walker.h"

namespace quillet {
namespace {

// Parentheses nested deeper are those of a tree that a host tied to itself.
constexpr int kMaxParentheses = 10'000'000;

constexpr Text kNoneLiteral = ":l:None: None";
constexpr Text kTrueLiteral = ":l:bool: True";
constexpr Text kFalseLiteral = ":l:bool: False";
static_assert(kTrueLiteral.starts_with(kTypedLiteralPrefix));

Text NumberClass(const CNumberLiteral* number) { return number->IsFloat() ? "float" : "int"; }

}  // namespace

Text CNodeWalker::WithTrailer(Text text, Text extra_trailer) {
  if (IsNone(text) || IsNone(extra_trailer)) return text;
  return equiv_buffer_.assign(text).append(extra_trailer);
}

Text CNodeWalker::LiteralInfo(Text cls_name, Text literal) {
  equiv_buffer_.clear();
  AppendLiteralInfo(cls_name, literal, equiv_buffer_);
  return equiv_buffer_;
}

Text CNodeWalker::StringInstanceName(const CStringLiteral* node) const {
  if (node->IsBytes()) return kBytesInstanceName;
  return node->IsUnicode() && !fPy3 ? kUnicodeInstanceName : kStringInstanceName;
}

Text CNodeWalker::TypeEquivForNode(CNode* node, Text extra_trailer) {
  if (node == nullptr) ThrowNoAttribute("fText");
  if (extra_trailer.empty()) extra_trailer = kNoText;
  const bool has_trailer = !IsNone(extra_trailer);

  // Parentheses are looked through, but not those of a tuple. What is no tuple is none inside its
  // parentheses either, so the question is asked once.
  if (auto* atom = dyn_cast<CAtom>(node); atom != nullptr && atom->GetInitialBracket() == "(") {
    if (IsTupleLiteralNode(node)) return has_trailer ? kNoText : LiteralInfo("tuple", fToText.TextForNode(node));
    int depth = 0;
    do {
      if (++depth > kMaxParentheses) ThrowError(ErrorKind::kRecursionError, "maximum recursion depth exceeded");
      Assert(node->ChildCount() == 3, "parentheses that hold neither a tuple nor an expression");
      node = node->ChildAt(1);
      if (node == nullptr) ThrowNoAttribute("fText");
    } while (isa<CAtom>(node) && cast<CAtom>(node)->GetInitialBracket() == "(");
  }
  if (auto* atom = dyn_cast<CAtom>(node)) return EquivForAtom(atom, extra_trailer);

  if (auto* list = dyn_cast<CTestListStarExpr>(node); list != nullptr && list->IsTuple()) {
    if (has_trailer) return kNoText;
    const Text text = fToText.TextForNode(node);
    if (IsNone(text)) return LiteralInfo("tuple", kNoText);
    // "( )" is how the empty tuple reads everywhere.
    scratch_.assign("(").append(text.empty() ? Text(" ") : text).append(")");
    return LiteralInfo("tuple", scratch_);
  }
  auto* factor = dyn_cast<CFactorExpr>(node);
  if (factor != nullptr) {
    const Text sign = factor->GetUnaryOperator();
    auto* number = dyn_cast<CNumberLiteral>(factor->GetChild(1));
    if (number != nullptr && (sign == "+" || sign == "-")) {
      if (has_trailer) return kNoText;
      if (!fIncludeExprText) return LiteralInfo(NumberClass(number), kNoText);
      scratch_.assign(sign).append(number->fText());
      return LiteralInfo(NumberClass(number), scratch_);
    }
  }

  // The words are told by their text alone, whatever class they have.
  if (node->code == word::kNone) return has_trailer ? kNoText : kNoneLiteral;
  if (node->code == word::kTrue) return has_trailer ? kNoText : kTrueLiteral;
  if (node->code == word::kFalse) return has_trailer ? kNoText : kFalseLiteral;

  if (auto* number = dyn_cast<CNumberLiteral>(node)) {
    if (has_trailer) return kNoText;
    return LiteralInfo(NumberClass(number), fIncludeExprText ? number->fText() : kNoText);
  }
  if (auto* string = dyn_cast<CStringLiteral>(node)) {
    if (has_trailer) return kNoText;
    const Text instance_name = StringInstanceName(string);
    if (!fIncludeExprText) return instance_name;
    equiv_buffer_.assign(instance_name).append(" ");
    AppendEncodedStringLiteral(string->fText(), equiv_buffer_);
    return equiv_buffer_;
  }
  if (auto* power = dyn_cast<CPower>(node)) {
    if (power->GetExponentNode() != nullptr) return is_complete_ ? EquivForPower(power, extra_trailer) : kNoText;
    return WithTrailer(fToText.TextForAtomPlusTrailers(power->GetAtom(), power->TrailerSpan()), extra_trailer);
  }
  if (auto* atom_expr = dyn_cast<CAtomExpr>(node)) {
    return WithTrailer(fToText.TextForAtomPlusTrailers(atom_expr->GetAtom(), atom_expr->TrailerSpan()), extra_trailer);
  }
  if (factor == nullptr && !isa<COperatorExpression>(node)) {
    // A name. A ternary, a lambda or a generator has no dotted name and thus no equivalent.
    return WithTrailer(fToText.TextForNode(node, {.dotted_name_only = true}), extra_trailer);
  }
  const Text text = fToText.TextForNode(node, {.add_parens_if_operator = has_trailer});
  return EquivForOperatorText(text, extra_trailer);
}

// A power, as any other operator expression.
Text CNodeWalker::EquivForPower(CPower* power, Text extra_trailer) {
  const Text text = fToText.TextForNode(power, {.add_parens_if_operator = !IsNone(extra_trailer)});
  return EquivForOperatorText(text, extra_trailer);
}

Text CNodeWalker::EquivForOperatorText(Text text, Text extra_trailer) {
  met_operator_text_ = true;
  if (IsNone(text) || text.size() > kMaxOperatorText) return kNoText;
  return equiv_buffer_.assign(kExpressionEquivPrefix).append(text).append(extra_trailer);
}

// Any atom but parentheses.
Text CNodeWalker::EquivForAtom(CAtom* atom, Text extra_trailer) {
  const bool has_trailer = !IsNone(extra_trailer);
  const Text bracket = atom->GetInitialBracket();
  if (bracket == "[" || bracket == "{") {
    if (has_trailer) return kNoText;
    // Comprehensions are literals of their class, too.
    const Text cls_name = bracket == "[" ? "list" : IsSetLiteral(atom) ? "set" : "dict";
    return LiteralInfo(cls_name, fToText.TextForNode(atom, {.literal_only = true}));
  }
  if (atom->IsTwoPlusStringLiterals()) {
    // The text of strings side by side is left out, whatever fIncludeExprText says.
    return has_trailer ? kNoText : StringInstanceName(cast<CStringLiteral>(atom->children[0]));
  }
  const Text text = fToText.TextForNode(atom);
  if (IsNone(text) && has_trailer) ThrowError(ErrorKind::kTypeError, "an atom without a text has no trailer");
  return WithTrailer(text, extra_trailer);
}

void CNodeWalker::AppendEquivNode(CNode* name_node, CNode* equiv_node, Text extra_trailer) {
  const Text text = fToText.TextForNode(name_node);
  if (IsNone(text)) return;
  const Text name = Keep(text);
  // a[0] = 1 says something of a[0] and defines no name.
  if (name.find('[') == Text::npos) AddKeptNameDefined(name);
  if (equiv_node == nullptr) return;
  if (const Text equiv = TypeEquivForNode(equiv_node, extra_trailer); !IsNone(equiv)) {
    AddStableTypeEquiv(name, Keep(equiv));
  }
}

void CNodeWalker::AppendSubscriptedEquivNode(CNode* name_node, CNode* equiv_node, int64_t subscript) {
  const Text text = fToText.TextForNode(name_node);
  if (IsNone(text)) return;
  const Text name = Keep(text);
  AddKeptNameDefined(name);
  if (equiv_node == nullptr) return;
  const Text equiv = TypeEquivForNode(equiv_node);
  // An element of a literal is not worked out.
  if (IsNone(equiv) || equiv.starts_with(kTypedLiteralPrefix)) return;
  if (equiv.starts_with(kExpressionEquivPrefix)) {
    // The subscript is one of the whole expression.
    scratch_.assign(kExpressionEquivPrefix).append("(").append(equiv.substr(kPrefixLen)).append(")");
  } else {
    scratch_.assign(equiv);
  }
  if (subscript == -1) {
    scratch_.append(kIterationSubscript);
  } else {
    scratch_.append("[").append(std::to_string(subscript)).append("]");
  }
  AddStableTypeEquiv(name, Keep(scratch_));
}

void CNodeWalker::AddNodeInfoStr(CNode* name_node, Text istr) {
  if (istr.empty()) return;
  if (const Text name = fToText.TextForNode(name_node); !IsNone(name)) AddTypeEquiv(name, istr);
}

Text CNodeWalker::TypeEquivForOperatorExpression(COperatorExpression* node) {
  if (!fIncludeOperatorExpressions) return kNoText;
  const int64_t term_count = node->GetTermCount();
  if (term_count == 0) return kNoText;
  std::string joined;
  const bool is_unary = term_count == 1;
  // The operator in front of each term: a lone term has one, and the first of several has none.
  int64_t operator_i = is_unary ? 0 : -1;
  for (int64_t i = 0; i < term_count; ++i, ++operator_i) {
    CNode* const term = node->GetTerm(i);
    Text op = kNoText;
    if (operator_i != -1) {
      op = node->GetOperatorStr(operator_i);
      if (IsNone(op)) return kNoText;
      if (!joined.empty()) joined.append(" ");
      joined.append(op);
    }
    Text equiv = TypeEquivForNode(term);
    if (IsNone(equiv)) return kNoText;
    if (equiv.starts_with(kTypedLiteralPrefix)) {
      // Only the literal's own text is shown.
      const size_t at = equiv.find(": ", kPrefixLen);
      if (at == Text::npos || at + 2 == equiv.size()) return kNoText;
      equiv.remove_prefix(at + 2);
    }
    const bool is_signed_number = is_unary && (op == "+" || op == "-") && isa<CNumberLiteral>(term);
    if (!joined.empty() && !is_signed_number) joined.append(" ");
    joined.append(equiv);
  }
  return equiv_buffer_.assign(joined);
}

}  // namespace quillet
