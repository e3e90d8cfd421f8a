// The places in a statement's children.
//
// A compound statement comes with a placeholder for its body, so only the parts of its head have a
// meaning. Some answers look wrong and are relied on by callers: the guard of `case x: y`, the else
// of a for statement, the list of augmented operators. Each says so where it stands.
#include "tree/nodes.h"

namespace quillet {
namespace {

std::vector<Text> NamesAfterKeyword(const CNode* node) {
  std::vector<Text> names;
  for (uint32_t i = 1; i < node->child_count; ++i) {
    if (isa<CNameLiteral>(node->children[i])) names.push_back(node->children[i]->fText());
  }
  return names;
}

// The operators that a statement is an augmented assignment by, as bits above tok::PLUSEQUAL. "|="
// and "@=" are left out on purpose: `a |= b` counts as having no operator.
constexpr uint32_t AugBit(TokenCode code) { return 1u << (code - tok::PLUSEQUAL); }
constexpr uint32_t kAugAssignOps =
    AugBit(tok::PLUSEQUAL) | AugBit(tok::MINEQUAL) | AugBit(tok::STAREQUAL) | AugBit(tok::SLASHEQUAL) |
    AugBit(tok::PERCENTEQUAL) | AugBit(tok::AMPEREQUAL) | AugBit(tok::CIRCUMFLEXEQUAL) | AugBit(tok::LEFTSHIFTEQUAL) |
    AugBit(tok::RIGHTSHIFTEQUAL) | AugBit(tok::DOUBLESTAREQUAL) | AugBit(tok::DOUBLESLASHEQUAL);

}  // namespace

// ---- classes, functions, decorators ----

CNode* CClassdefStmt::GetBaseClassesNode() const {
  if (child_count < 4 || !ChildIs(2, tok::LPAR) || ChildIs(3, tok::RPAR)) return nullptr;
  return children[3];
}

UsedArgList CClassdefStmt::GetBaseClassList() const {
  CNode* bases = GetBaseClassesNode();
  return bases != nullptr ? GetUsedArgInfoList(bases) : UsedArgList();
}

CParametersNode* CFuncdefStmt::GetParameters() const { return Expect<CParametersNode>(ChildAt(2)); }

CNode* CFuncdefStmt::GetReturnType() const {
  // "@=" has the code of the arrow.
  if (!ChildIs(3, tok::RARROW) || children[3]->fText() != "->") return nullptr;
  return Expect<CExpression>(ChildAt(4));
}

// The closing bracket is looked for in fifth place only, so `@foo()` has no arguments here too.
CNode* CSingleDecorator::GetUsedArgsNode() const {
  return child_count > 4 && ChildIs(2, tok::LPAR) && ChildIs(4, tok::RPAR) ? children[3] : nullptr;
}

UsedArgList CSingleDecorator::GetUsedArgList() const {
  CNode* args = GetUsedArgsNode();
  return args != nullptr ? GetUsedArgInfoList(args) : UsedArgList();
}

// ---- simple statements ----

NodeList CDelStmt::GetExpressions() const {
  NodeList expressions;
  if (child_count != 2) return expressions;
  const auto* list = dyn_cast<CTestListStarExpr>(children[1]);
  if (list == nullptr) {
    expressions.push_back(children[1]);
    return expressions;
  }
  const int32_t count = list->GetSubExprCount();
  expressions.reserve(count);
  for (int32_t i = 0; i < count; ++i) expressions.push_back(list->GetSubExpr(i));
  return expressions;
}

std::vector<Text> CGlobalStmt::GetUtf8NameList() const { return NamesAfterKeyword(this); }
std::vector<Text> CNonlocalStmt::GetUtf8NameList() const { return NamesAfterKeyword(this); }

CNode* CExprStmt::GetPostEqualsTestExpr(int64_t equal_num) const {
  if (!has_children) ThrowNoSuchChild(this);
  const int64_t place = EverySecond(equal_num, 2);
  if (place >= int64_t{child_count}) ThrowError(ErrorKind::kValueError, "Not enough ='s");
  return ChildAt(place);
}

Text CExprStmt::GetAugAssignOp() const {
  const Text op = GetChildText(1);
  if (IsNone(op)) return kNoText;
  const unsigned place = static_cast<unsigned>(children[1]->code) - tok::PLUSEQUAL;
  if (place < 32 && (kAugAssignOps >> place & 1) != 0) return op;
  // ",=" is on the list although no grammar has such a token.
  return op == ",=" ? op : kNoText;
}

// ---- with, except ----

NodeList CWithStmt::GetWithItems() const {
  NodeList items;
  for (CNode* child : fChildren()) {
    if (isa<CWithItem>(child)) items.push_back(child);
  }
  return items;
}

// Read from the end, which serves both grammars' clauses.
CNode* CExceptClause::GetTarget() const {
  const int64_t separator = int64_t{child_count} - 2;
  if (separator < 1) return nullptr;
  return ChildAtIs(separator, tok::COMMA) || ChildAtIs(separator, word::kAs) ? LastChild() : nullptr;
}

// ---- type parameters ----

CNode* CTypeParameter::GetName() const {
  if (child_count == 1 || child_count == 2) return LastChild();
  return GetChild(-3);  // the name in `name : bound` and `prefix name : bound` alike
}

Text CTypeParameter::GetPrefix() const {
  if (ChildAtIs(0, tok::STAR)) return "*";
  return ChildAtIs(0, tok::DOUBLESTAR) ? Text("**") : kNoText;
}

CNode* CTypeParameter::GetSpecNode() const { return child_count >= 3 ? LastChild() : nullptr; }

NodeList CWithTypeParameters::GetTypeParameters() const {
  const NodeSpan parameters = TypeParameterSpan();
  return {parameters.begin(), parameters.end()};
}

}  // namespace quillet
