// What may be assigned to, and what the language calls that which may not.
//
// A tree says enough: names, attributes and subscripts are targets, lists and tuples of targets are, and a
// bracket around one changes nothing.
#include "parser/complete_parser.h"

namespace quillet {

namespace {

bool IsState(const CNode* node, int symbol) {
  return node->fClsInfo != nullptr && !node->IsLeaf() && node->fClsInfo->fNodeType == symbol;
}

// What stands in `( x )`, however deep; a tuple, a generator or yield in brackets is no such thing.
const CNode* CompleteInnermost(const CNode* node) {
  while (isa<CAtom>(node) && node->child_count == 3 && node->ChildIs(0, tok::LPAR)) {
    const CNode* inner = node->children[1];
    if (isa<CTestListStarExpr>(inner)) {
      if (!cast<CTestListStarExpr>(inner)->IsTuple()) return inner;
      break;
    }
    node = inner;
  }
  return node;
}

bool IsTupleNode(const CNode* node) {
  if (isa<CTestListStarExpr>(node)) return cast<CTestListStarExpr>(node)->IsTuple();
  if (!isa<CAtom>(node) || !node->ChildIs(0, tok::LPAR)) return false;
  return node->child_count == 2 || isa<CTestListStarExpr>(node->children[1]);
}

bool IsListNode(const CNode* node) {
  return isa<CAtom>(node) && node->ChildIs(0, tok::LSQB) && !cast<CAtom>(node)->IsComprehension();
}

}  // namespace

bool CompleteParser::IsBracketed(const CNode* node) const {
  if (!isa<CAtom>(node)) return false;
  if (node->ChildIs(0, tok::LSQB)) return true;
  return node->ChildIs(0, tok::LPAR) && (node->child_count == 2 || isa<CTestListStarExpr>(node->children[1]));
}

const CNode* CompleteParser::WithoutBrackets(const CNode* node) { return CompleteInnermost(node); }

bool CompleteParser::IsNameInBrackets(const CNode* node) const { return isa<CNameLiteral>(CompleteInnermost(node)); }

// Whether the expression binds at least as tight as "|".
bool CompleteParser::IsBitwiseOr(const CNode* node) const {
  return !IsState(node, symbols_.test) && !IsState(node, symbols_.or_test) && !IsState(node, symbols_.and_test) &&
         !IsState(node, symbols_.not_test) && !IsState(node, symbols_.comparison) && !isa<CLambdaExpr>(node) &&
         !IsState(node, symbols_.namedexpr_test) && !IsState(node, symbols_.testlist_star_expr) &&
         !isa<CStarExpression>(node);
}

const char* CompleteParser::NameOfExpression(const CNode* node) const {
  node = CompleteInnermost(node);
  if (isa<CLambdaExpr>(node)) return "lambda";
  if (isa<CNamedExpr>(node)) return "named expression";
  if (isa<CStarExpression>(node)) return "starred";
  if (isa<CYieldExpr>(node) || node->code == word::kYield) return "yield expression";
  if (isa<CIfElseExpression>(node)) return "conditional expression";
  if (IsState(node, symbols_.comparison)) return "comparison";
  if (isa<COperatorExpression>(node) || isa<CFactorExpr>(node)) return "expression";
  if (const auto* power = dyn_cast<CPower>(node)) {
    if (power->GetExponentNode() != nullptr) return "expression";
  }
  if (const auto* chain = dyn_cast<CAtomExpr>(node)) {
    if (chain->GetPrefix() != nullptr) return "await expression";
    const CNode* trailer = chain->LastChild();
    return trailer->ChildIs(0, tok::DOT) ? "attribute" : trailer->ChildIs(0, tok::LSQB) ? "subscript" : "function call";
  }
  if (const auto* list = dyn_cast<CTestListStarExpr>(node)) return list->IsTuple() ? "tuple" : "generator expression";
  if (const auto* atom = dyn_cast<CAtom>(node)) {
    if (atom->IsTwoPlusStringLiterals()) {
      for (const CNode* string : atom->fChildren())
        if (isa<CStringLiteral>(string) && cast<CStringLiteral>(string)->IsFormatted()) return "f-string expression";
      return "literal";
    }
    if (atom->ChildIs(0, tok::LPAR)) return "tuple";
    if (atom->ChildIs(0, tok::LSQB)) return atom->IsComprehension() ? "list comprehension" : "list";
    if (atom->ChildIs(0, tok::BACKQUOTE)) return "expression";
    const bool is_set = atom->child_count == 3 && IsSetLiteral(atom) && !atom->children[1]->ChildIs(0, tok::DOUBLESTAR);
    if (atom->IsComprehension()) return is_set ? "set comprehension" : "dict comprehension";
    return is_set ? "set display" : "dict literal";
  }
  switch (node->code) {
    case word::kNone:
      return "None";
    case word::kTrue:
      return "True";
    case word::kFalse:
      return "False";
    case tok::ELLIPSIS:
      return "ellipsis";
    case tok::NUMBER:
      return "literal";
    case tok::STRING:
      return isa<CStringLiteral>(node) && cast<CStringLiteral>(node)->IsFormatted() ? "f-string expression" : "literal";
    default:
      return "name";
  }
}

const CNode* CompleteParser::InvalidTarget(const CNode* node, TargetUse use) const {
  node = CompleteInnermost(node);
  if (const auto* star = dyn_cast<CStarExpression>(node))
    return use == TargetUse::kDelete ? node : InvalidTarget(star->children[1], use);
  if (IsTupleNode(node) || IsListNode(node)) {
    const CNode* list = node;
    if (isa<CAtom>(node)) {
      if (node->child_count == 2) {
        // `() = x` came with 3.6.
        return nullptr;
      }
      list = node->children[1];
      if (!isa<CTestListStarExpr>(list)) return InvalidTarget(list, use);
    }
    for (const CNode* child : list->fChildren()) {
      if (child->code == tok::COMMA) continue;
      if (const CNode* invalid = InvalidTarget(child, use)) return invalid;
    }
    return nullptr;
  }
  if (use == TargetUse::kFor && IsState(node, symbols_.comparison) && node->ChildIs(1, word::kIn))
    return InvalidTarget(node->children[0], use);
  if (const auto* chain = dyn_cast<CAtomExpr>(node)) {
    if (chain->GetPrefix() != nullptr) return node;
    const CNode* trailer = chain->LastChild();
    return trailer->ChildIs(0, tok::DOT) || trailer->ChildIs(0, tok::LSQB) ? nullptr : node;
  }
  if (!node->IsLeaf() || !IsNameCode(node->code) || node->code == word::kYield) return node;
  const bool is_constant = node->code == word::kNone || node->code == word::kTrue || node->code == word::kFalse;
  // 2 has one constant that is no name, and lets it be deleted.
  if (is_constant && (python3_ || (node->code == word::kNone && use != TargetUse::kDelete))) return node;
  return nullptr;
}

void CompleteParser::CheckTarget(const CNode* node, TargetUse use, bool may_mean_equal) {
  const CNode* invalid = InvalidTarget(node, use);
  if (invalid == nullptr) {
    CheckTargetNames(node, use);
    return;
  }
  const std::string verb = use == TargetUse::kDelete ? "cannot delete " : "cannot assign to ";
  const TokenCode code = invalid->code;
  const bool is_constant = code == word::kNone || code == word::kTrue || code == word::kFalse;
  const bool hints = may_mean_equal && !is_constant && IsBitwiseOr(invalid) && !IsBracketed(invalid);
  FailAtNode(invalid, verb + NameOfExpression(invalid) + (hints ? " here. Maybe you meant '==' instead of '='?" : ""));
}

// `__debug__`, and more than one star in a list.
void CompleteParser::CheckTargetNames(const CNode* node, TargetUse use) {
  node = CompleteInnermost(node);
  if (const auto* star = dyn_cast<CStarExpression>(node)) return CheckTargetNames(star->children[1], use);
  if (const auto* chain = dyn_cast<CAtomExpr>(node)) {
    const CNode* trailer = chain->LastChild();
    if (!trailer->ChildIs(0, tok::DOT)) return;
    if (use == TargetUse::kDelete ? !Since(14) : use == TargetUse::kAugment && Since(9) && !Since(14)) return;
    const Text name = trailer->GetChildText(1);
    if (name == "__debug__" || (!python3_ && name == "None"))
      PostponeAtNode(chain, (use == TargetUse::kDelete ? "cannot delete " : "cannot assign to ") + std::string(name),
                     kCompiler);
    return;
  }
  if (node->IsLeaf()) {
    if (node->fText() != "__debug__") return;
    if (use != TargetUse::kDelete)
      PostponeAtNode(node, "cannot assign to __debug__", kCompiler);
    else if (Since(10))
      PostponeAtNode(node, "cannot delete __debug__", kCompiler);
    return;
  }
  if (!IsTupleNode(node) && !IsListNode(node)) return;
  const CNode* list = node;
  if (isa<CAtom>(node)) {
    if (node->child_count != 3) return;
    list = node->children[1];
  }
  if (!isa<CTestListStarExpr>(list)) return CheckTargetNames(list, use);
  int stars = 0;
  for (const CNode* child : list->fChildren()) {
    if (child->code == tok::COMMA) continue;
    if (isa<CStarExpression>(child) && ++stars == 2)
      PostponeAtNode(node, "multiple starred expressions in assignment", kCompiler);
    CheckTargetNames(child, use);
  }
}

// `(a).b`, whose brackets the language takes for those around a whole target.
bool CompleteParser::BeginsWithBracketedTarget(const CNode* node) const {
  if (!isa<CAtomExpr>(node)) return false;
  const CNode* inner = WithoutBrackets(node->children[0]);
  return inner != node->children[0] && !IsBracketed(inner) && !isa<CStarExpression>(inner) &&
         InvalidTarget(inner, TargetUse::kAnnotate) == nullptr;
}

void CompleteParser::CheckSubscriptStars(const CNode* node) {
  if (!isa<CAtomExpr>(node) || !node->LastChild()->ChildIs(0, tok::LSQB)) return;
  const CNode* subscripts = node->LastChild()->children[1];
  if (isa<CStarExpression>(subscripts)) return CheckNoLoneStar(subscripts);
  for (const CNode* child : subscripts->fChildren())
    if (isa<CStarExpression>(child)) return CheckNoLoneStar(child);
}

// A star that stands alone, where a list of expressions may stand.
void CompleteParser::CheckNoLoneStar(const CNode* node) {
  if (isa<CStarExpression>(node)) PostponeAtNode(node, "can't use starred expression here", kCompiler);
}

// No star at all, as in front of the version that took them there.
void CompleteParser::CheckNoStars(const CNode* node) {
  if (isa<CStarExpression>(node)) FailAtNode(node, "invalid syntax");
  if (!isa<CTestListStarExpr>(node)) return;
  for (const CNode* child : node->fChildren())
    if (isa<CStarExpression>(child)) FailAtNode(child, "invalid syntax");
}

}  // namespace quillet
