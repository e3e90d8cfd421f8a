// What literals and brackets say without being evaluated: the kind and contents of a string, whether
// a number is a float, whether an atom is a tuple, list, set, dict or comprehension.
//
// The tests are those that callers rely on and are kept narrow: any "e" makes a number a float, a
// hexadecimal one too; IsGenExpression looks for the word and IsGenExpr for the clause, and the two
// differ. Prefix letters and quotes are ASCII, so bytes are compared and characters never decoded.
#include "tree/nodes.h"

namespace quillet {
namespace {

Text RequireText(const CNode* node) {
  if (!node->IsLeaf()) ThrowError(ErrorKind::kTypeError, "object of type 'NoneType' has no len()");
  return node->fText();
}

char CharAt(Text text, size_t index) {
  if (index >= text.size()) ThrowError(ErrorKind::kIndexError, "string index out of range");
  return text[index];
}

// Upper case of an ASCII letter; other characters may change too, but into no letter asked for here.
char Upper(char c) { return static_cast<char>(c & ~0x20); }

// Whether the literal has this letter in first place, or behind an "r" there.
bool HasLeadingLetter(const CStringLiteral* literal, char letter) {
  const Text text = RequireText(literal);
  if (text.empty()) return false;
  char c = text[0];
  if (Upper(c) == 'R') c = CharAt(text, 1);
  return Upper(c) == letter;
}

bool IsPrefixLetter(char c) {
  const char upper = Upper(c);
  return upper == 'B' || upper == 'F' || upper == 'R' || upper == 'U';
}

size_t PrefixLength(Text text) {
  size_t length = 0;
  while (length < text.size() && IsPrefixLetter(text[length])) ++length;
  return length;
}

}  // namespace

// ---- numbers and strings ----

// By design true for 0xe as well.
bool CNumberLiteral::IsFloat() const { return RequireText(this).find_first_of(".eE") != Text::npos; }

bool CStringLiteral::IsUnicode() const { return HasLeadingLetter(this, 'U'); }
bool CStringLiteral::IsBytes() const { return HasLeadingLetter(this, 'B'); }

bool CStringLiteral::IsFormatted() const {
  const Text token = RequireText(this);
  return token.substr(0, PrefixLength(token)).find_first_of("fF") != Text::npos;
}

Text CStringLiteral::GetStringContents() const {
  const Text token = RequireText(this);
  const size_t start = PrefixLength(token);
  const char quote = CharAt(token, start);
  if (quote != '\'' && quote != '"') return "";
  size_t quote_length = 1;
  if (start + 1 < token.size() && token[start + 1] == quote) {
    // Two quotes that no third one follows are the empty literal.
    if (start + 2 >= token.size() || token[start + 2] != quote) return "";
    quote_length = 3;
  }
  const Text opening = token.substr(start, quote_length);
  const size_t first = start + quote_length;
  // An unterminated token runs to its end. Where opening and closing overlap nothing is between.
  const size_t end = token.ends_with(opening) ? token.size() - quote_length : token.size();
  return first < end ? token.substr(first, end - first) : Text("");
}

// ---- atoms ----

Text CAtom::GetInitialBracket() const {
  if (child_count == 0) ThrowError(ErrorKind::kValueError, "Atom node with no children");
  if (ChildIs(0, tok::LPAR)) return "(";
  if (ChildIs(0, tok::LSQB)) return "[";
  return ChildIs(0, tok::LBRACE) ? Text("{") : kNoText;
}

bool CAtom::IsComprehension() const {
  if (child_count != 3) return false;
  const CNode* body = children[1];
  if (body == nullptr) ThrowNoAttribute("fChildren");
  // `k: v for ...` has its clause behind the value.
  return isa<CCompForNode>(body->Child(1)) || isa<CCompForNode>(body->Child(3));
}

bool IsSetLiteral(const CAtom* node) {
  if (node->GetInitialBracket() != "{" || node->child_count != 3) return false;
  const CNode* body = node->children[1];
  if (body == nullptr) ThrowNoAttribute("fChildren");
  // One element has collapsed to a leaf. A set comprehension passes, a dict's colon does not.
  return !body->HasChildWithCode(tok::COLON);
}

// The clause node of a generator expression has no text of its own, so this is false for one: only
// a direct child "for" counts.
bool IsGenExpression(const CAtom* node) {
  if (node->child_count != 3 || node->GetInitialBracket() != "(") return false;
  const CNode* body = node->children[1];
  if (body == nullptr) ThrowNoAttribute("GetChildCount");
  return body->HasChildWithCode(word::kFor);
}

bool IsTupleLiteralNode(const CNode* node) {
  DescentBound bound;
  while (const auto* atom = dyn_cast<CAtom>(node)) {
    bound.Step();
    if (atom->GetInitialBracket() != "(") return false;
    if (atom->child_count == 2) return true;
    Assert(atom->child_count == 3, "");
    node = atom->children[1];
  }
  return isa<CTestListStarExpr>(node) && node->HasChildWithCode(tok::COMMA);
}

CNode* DropSimpleParens(CNode* node) {
  DescentBound bound;
  while (isa<CAtom>(node) && node->child_count == 3 && node->ChildIs(0, tok::LPAR)) {
    bound.Step();
    CNode* inner = node->children[1];
    // A tuple or generator expression is no simple parenthesis.
    if (isa<CTestListStarExpr>(inner) || isa<CCompForNode>(inner)) break;
    node = inner;
  }
  return node;
}

bool ExpandSeqLiteral(CNode* node, NodeList& elements) {
  elements.clear();
  node = DropSimpleParens(node);
  if (!isa<CAtom>(node) || !node->ChildIs(0, tok::LPAR)) return false;
  if (node->child_count == 2) return true;
  CNode* inner = node->GetChild(1);
  const auto* list = dyn_cast<CTestListStarExpr>(inner);
  if (list == nullptr) {
    elements.push_back(inner);
    return true;
  }
  const int32_t count = list->GetSubExprCount();
  for (int32_t i = 0; i < count; ++i) elements.push_back(list->GetSubExpr(i));
  return true;
}

}  // namespace quillet
