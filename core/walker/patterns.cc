// Match and case statements and type parameters, as the hand-written parsers build them.
//
// A bare name in a pattern is captured and so defined; all else in it is read. Only patterns that
// are nodes of their own are walked: a lone name, constant or dotted value at the top of a case line
// is none, and records nothing. That is meant, and so is the keyword of name=pattern being neither
// read nor defined.

#include "vocabulary/symbolinfo.h"
#include "walker/walker.h"

namespace quillet {

void CNodeWalker::VisitMatchStmt(CMatchStmt* node) { VisitNode(node->GetTestExpression()); }

void CNodeWalker::VisitCaseStmt(CCaseStmt* node) {
  if (CNode* pattern = node->GetPattern(); isa<CPatternNode>(pattern)) VisitPatternNode(pattern);
  if (CNode* guard = node->GetGuard()) VisitNode(guard);
  if (CNode* body = node->GetBody()) VisitNode(body);
}

void CNodeWalker::VisitPatternNode(CNode* node) { VisitPatternAtDepth(node, 0); }

void CNodeWalker::VisitPatternAtDepth(CNode* node, int depth) {
  if (node == nullptr) ThrowNoAttribute("fChildren");
  if (depth >= kMaxPatternDepth) {
    ThrowError(ErrorKind::kRecursionError, "maximum recursion depth exceeded while walking a pattern");
  }
  uint32_t start = 0;
  if (isa<CClassPatternNode>(node)) {
    VisitNode(node->GetChild(0));
    start = 1;
  } else if (isa<CClassArgumentPatternNode>(node)) {
    start = node->ChildIs(1, tok::EQUAL) ? 2 : 0;
  }
  for (uint32_t i = start; i < node->child_count; ++i) {
    CNode* const child = node->children[i];
    if (child == nullptr) ThrowNoAttribute("fText");
    // The wildcard binds nothing.
    if (child->code == word::kUnderscore) continue;
    if (isa<CNameLiteral>(child)) {
      AddNameDefined(child->fText());
    } else if (isa<CExpression>(child)) {
      VisitNode(child);
    } else if (isa<CPatternNode>(child)) {
      VisitPatternAtDepth(child, depth + 1);
    }
  }
}

void CNodeWalker::VisitTypeParameter(CTypeParameter* node) {
  if (is_complete_) return VisitWholeTypeParameter(node);
  const CNode* const name = node->GetName();
  if (name == nullptr) return;
  const Text prefix = node->GetPrefix();
  CNode* const spec = node->GetSpecNode();
  Text spec_text = kNoText;
  if (spec != nullptr) {
    VisitNode(spec);
    spec_text = fToText.TextForNode(spec);
  }
  // A type alias opens no scope for the parameter to be recorded in.
  if (!IsScopeStartLogical(RequireLogical())) return;
  scratch_.assign(kTypeParameterPrefix);
  if (!IsNone(prefix)) scratch_.append(prefix);
  if (!IsNone(spec_text)) {
    if (!IsNone(prefix)) scratch_.append(" ");
    scratch_.append(spec_text);
  }
  AddArgInfoBytes(name->fText(), scratch_);
}

// With its default, and also where it is that of a type alias.
void CNodeWalker::VisitWholeTypeParameter(CTypeParameter* node) {
  const Text prefix = node->GetPrefix();
  const uint32_t name_place = IsNone(prefix) ? 0 : 1;
  const CNode* const name = node->Child(name_place);
  if (name == nullptr || !name->IsLeaf()) return;
  std::string detail;
  for (uint32_t i = name_place + 2; i < node->child_count; i += 2) {
    VisitNode(node->children[i]);
    const Text text = fToText.TextForNode(node->children[i]);
    if (IsNone(text)) continue;
    if (!detail.empty()) detail.append(" ");
    if (node->ChildIs(i - 1, tok::EQUAL)) detail.append("= ");
    detail.append(text);
  }
  scratch_.assign(kTypeParameterPrefix);
  if (!IsNone(prefix)) scratch_.append(prefix);
  if (!IsNone(prefix) && !detail.empty()) scratch_.append(" ");
  scratch_.append(detail);
  AddArgInfoBytes(name->fText(), scratch_);
}

}  // namespace quillet
