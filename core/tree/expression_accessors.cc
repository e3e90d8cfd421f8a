// The places in an expression's children, for both grammars' layouts.
//
// What stands in a place is told by its class: the newer grammar nests an atom and its trailers in a
// CAtomExpr below the CPower, the older holds them directly; `async for` is one flat node or a node
// in a node. Nothing here recurses: brackets nest as deep as the source likes.
#include "tree/node_pool.h"
#include "tree/nodes.h"

namespace quillet {
namespace {

NodeList ListOf(NodeSpan nodes) { return {nodes.begin(), nodes.end()}; }

}  // namespace

// ---- sub-expressions ----

CNode* SubExprView::At(int32_t index) const {
  if (const auto* star_list = dyn_cast<CTestListStarExpr>(list)) return star_list->GetSubExpr(index);
  if (const auto* maker = dyn_cast<CListmakerNode>(list)) return maker->GetSubExpr(index);
  return index == 0 ? single : nullptr;
}

SubExprView CExpression::GetSubExprView() const {
  if (const auto* atom = dyn_cast<CAtom>(this)) return atom->GetSubExprView();
  if (const auto* star_list = dyn_cast<CTestListStarExpr>(this)) {
    return {.list = star_list, .single = nullptr, .count = star_list->GetSubExprCount()};
  }
  return {};
}

// An atom asks its inside for a count, and only where that has none does a list display count one
// element. So through any nest of brackets either the elements at the bottom show, or the inside of
// the innermost list display is the one element, or there are none.
SubExprView CAtom::GetSubExprView() const {
  SubExprView view;
  DescentBound bound;
  for (const CAtom* atom = this; atom != nullptr;) {
    bound.Step();
    const Text bracket = atom->GetInitialBracket();
    if (atom->child_count != 3 || (bracket != "(" && bracket != "[") || !atom->IsLiteral()) break;
    CNode* inner = atom->children[1];
    if (isa<CExpression>(inner) && bracket == "[") view.single = inner;
    if (const auto* star_list = dyn_cast<CTestListStarExpr>(inner)) {
      view.count = star_list->GetSubExprCount();
    } else if (const auto* maker = dyn_cast<CListmakerNode>(inner)) {
      view.count = maker->GetSubExprCount();
    }
    if (view.count != 0) view.list = inner;
    atom = dyn_cast<CAtom>(inner);
  }
  if (view.count != 0) {
    view.single = nullptr;
  } else if (view.single != nullptr) {
    view.count = 1;
  }
  return view;
}

int32_t CTestListStarExpr::GetSubExprCount() const {
  // A trailing comma adds nothing.
  return IsGenExpr() ? 0 : static_cast<int32_t>((child_count + 1) / 2);
}

CNode* CTestListStarExpr::GetSubExpr(int32_t index) const {
  if (IsGenExpr()) return nullptr;
  if (!has_children) ThrowNoSuchChild(this);
  const int64_t place = EverySecond(index, 0);
  if (place >= int64_t{child_count}) ThrowError(ErrorKind::kValueError, "Not enough expressions in list");
  CNode* child = ChildAt(place);
  if (!isa<CExpression>(child)) {
    // The spelling of the message is the one that hosts know.
    ThrowError(ErrorKind::kValueError, "Elenment " + std::to_string(place) + " of " + ReprOfNode(this) +
                                           " needs to be a CExpression; fChildren = " + ReprOfNodes(fChildren()));
  }
  return child;
}

int32_t CListmakerNode::GetSubExprCount() const {
  if (isa<CCompForNode>(ChildAt(1))) return 0;
  return static_cast<int32_t>((child_count - 1) / 2 + 1);
}

// Past the end this gives null where CTestListStarExpr fails.
CNode* CListmakerNode::GetSubExpr(int32_t index) const {
  if (isa<CCompForNode>(ChildAt(1))) return nullptr;
  return Expect<CExpression>(GetChild(EverySecond(index, 0)));
}

// ---- operators ----

CNode* COperatorExpression::GetTerm(int64_t i) const {
  // `not x` has one term, whatever is asked for.
  return GetTermCount() == 1 ? children[1] : GetChild(EverySecond(i, 0));
}

Text COperatorExpression::GetOperatorStr(int64_t i) const {
  const bool is_prefix = GetTermCount() == 1;
  if (is_prefix && i != 0) return kNoText;
  const int64_t place = is_prefix ? 0 : EverySecond(i, 1);
  if (place < 0 || place >= int64_t{child_count}) return kNoText;
  const CNode* op = children[place];
  if (op == nullptr) return kNoText;
  if (op->IsLeaf()) return op->fText();
  if (op->child_count != 2) return kNoText;
  if (op->ChildIs(0, word::kNot) && op->ChildIs(1, word::kIn)) return "not in";
  if (op->ChildIs(0, word::kIs) && op->ChildIs(1, word::kNot)) return "is not";
  // No grammar gives another pair; a tree made by hand may.
  const Text first = op->GetChildText(0);
  const Text second = op->GetChildText(1);
  if (IsNone(first) || IsNone(second)) return kNoText;
  return pool->Intern(std::string(first) + ' ' + std::string(second));
}

Text CFactorExpr::GetUnaryOperator() const {
  return ChildAtIs(0, tok::PLUS) || ChildIs(0, tok::MINUS) || ChildIs(0, tok::TILDE) ? children[0]->fText() : kNoText;
}

// ---- comprehensions ----

const CCompForNode* CCompForNode::Flat() const {
  const CCompForNode* node = this;
  DescentBound bound;
  while (node->IsAsync() && node->child_count == 2 && isa<CCompForNode>(node->children[1])) {
    bound.Step();
    node = static_cast<const CCompForNode*>(node->children[1]);
  }
  return node;
}

CNode* CCompForNode::GetTargetNode() const {
  const CCompForNode* flat = Flat();
  return flat->ChildAt(flat->IsAsync() ? 2 : 1);
}

CNode* CCompForNode::GetInNode() const {
  const CCompForNode* flat = Flat();
  return flat->ChildAt(flat->IsAsync() ? 4 : 3);
}

CNode* CCompForNode::GetCompIterNode() const {
  const CCompForNode* flat = Flat();
  const uint32_t place = flat->IsAsync() ? 5 : 4;
  return flat->child_count == place + 1 ? flat->children[place] : nullptr;
}

// ---- atoms and trailers ----

Text CTrailer::GetInitialToken() const {
  if (child_count == 0) ThrowError(ErrorKind::kValueError, "Trailer node with no children");
  return GetChildText(0);
}

CNode* CAtomExpr::GetAtom() const {
  if (!has_children) return nullptr;
  return ChildAt(GetPrefix() != nullptr ? 1 : 0);
}

NodeList CAtomExpr::GetTrailers() const { return ListOf(TrailerSpan()); }

CNode* CPower::GetAtom() const {
  CNode* first = ChildAt(0);
  const auto* atom_expr = dyn_cast<CAtomExpr>(first);
  return atom_expr != nullptr ? atom_expr->GetAtom() : first;
}

NodeSpan CPower::TrailerSpan() const {
  if (const auto* atom_expr = dyn_cast<CAtomExpr>(ChildAt(0))) return atom_expr->TrailerSpan();
  uint32_t end = 1;
  while (end < child_count && !ChildIs(end, tok::DOUBLESTAR)) ++end;
  return fChildren().subspan(1, end - 1);
}

NodeList CPower::GetTrailers() const { return ListOf(TrailerSpan()); }

// ---- yields ----

CNode* CYieldExpr::GetValue() const {
  if (child_count < 2) return nullptr;
  const auto* arg = dyn_cast<CYieldArg>(children[1]);
  return arg != nullptr ? arg->GetValue() : children[1];
}

bool CYieldExpr::IsYieldFrom() const {
  const auto* arg = dyn_cast<CYieldArg>(Child(1));
  return arg != nullptr && arg->IsYieldFrom();
}

CNode* CYieldArg::GetValue() const { return ChildAt(child_count < 2 ? 0 : 1); }

bool CYieldArg::IsYieldFrom() const {
  return child_count >= 2 && isa<CKeywordLiteral>(children[0]) && children[0]->code == word::kFrom;
}

}  // namespace quillet
