// What a complete reading asks of a walk: no limits that a source meets, and an eye for what the tables
// take and the language may not.
//
// Nothing is judged here. A doubt costs a second parse by the parser that knows every rule, so it is raised
// where the common shapes of a target, of arguments and of parameters end.
#include "lines/token_search.h"
#include "walker/walker.h"

namespace quillet {
namespace {

// Deeper trees come of brackets that the language itself does not take.
constexpr int32_t kMaxCompleteDepth = 1000;
constexpr int32_t kDepthOfTrailers = 2;

bool IsConstant(TokenCode code) { return code == word::kNone || code == word::kTrue || code == word::kFalse; }

bool IsDebugName(Text name) { return name.size() == 9 && name == "__debug__"; }

bool IsPlainTarget(const CNode* node) {
  if (isa<CNameLiteral>(node)) return node->code != word::kNone && !IsDebugName(node->fText());
  const auto* chain = dyn_cast<CAtomExpr>(node);
  if (chain == nullptr || chain->GetPrefix() != nullptr) return false;
  const CNode* trailer = chain->LastChild();
  return isa<CTrailer>(trailer) && trailer->child_count > 0 && trailer->children[0]->code != tok::LPAR;
}

bool IsPlainPower(const CNode* node) {
  const auto* power = dyn_cast<CPower>(node);
  if (power == nullptr || power->HasChildWithCode(tok::DOUBLESTAR)) return false;
  const CNode* trailer = power->LastChild();
  return isa<CTrailer>(trailer) && trailer->child_count > 0 && trailer->children[0]->code != tok::LPAR;
}

// In brackets.
bool IsPlainTuple(const CNode* node) {
  if (!IsTupleLiteralNode(node)) return false;
  const SubExprView elements = cast<CExpression>(node)->GetSubExprView();
  for (int32_t i = 0; i < elements.count; ++i) {
    if (!IsPlainTarget(elements.At(i)) && !IsPlainPower(elements.At(i))) return false;
  }
  return elements.count > 0;
}

// What tells of most names of a list that none like it stands in front, before they are compared.
class NamesBefore {
 public:
  // Of the next one.
  bool MayHold(Text name) {
    const uint64_t bit =
        name.empty() ? 1 : uint64_t{1} << ((name.size() * 8 + static_cast<unsigned char>(name[0])) % 64);
    const bool may_hold = (bits_ & bit) != 0;
    bits_ |= bit;
    return may_hold;
  }

 private:
  uint64_t bits_ = 0;
};

}  // namespace

void CNodeWalker::ReadCompletely() {
  is_complete_ = true;
  fMaxVisits = INT32_MAX;
  fMaxRecurseCount = kMaxCompleteDepth;
  depth_of_trailers_ = kDepthOfTrailers;
  fToText.set_shows_exponents(true);
}

void CNodeWalker::DoubtTarget(const CNode* target) {
  if (target == nullptr || IsPlainTarget(target) || IsPlainPower(target)) return;
  if (const auto* list = dyn_cast<CTestListStarExpr>(target); list != nullptr && list->IsTuple()) {
    for (const CNode* element : list->fChildren())
      if (element->code != tok::COMMA && !IsPlainTarget(element) && !IsPlainPower(element)) met_doubtful_ = true;
    return;
  }
  met_doubtful_ |= !IsPlainTuple(target);
}

void CNodeWalker::DoubtLambda(const CNode* node) {
  const Context first = node->children[0]->fContext;
  const TokenSpan toks = RequireLogical().toks;
  if (!first.IsIndex() || first.value <= 0 || static_cast<size_t>(first.value) >= toks.size()) return;
  met_doubtful_ |= toks[static_cast<size_t>(first.value) - 1].code == word::kIf;
}

// `{**a for b in c}`
void CNodeWalker::DoubtElement(const CNode* clause) {
  while (clause->child_count != 0 && clause->children[0] != nullptr) clause = clause->children[0];
  const TokenSpan toks = RequireLogical().toks;
  if (!clause->fContext.IsIndex() || static_cast<size_t>(clause->fContext.value) >= toks.size()) return;
  int depth = 0;
  for (auto i = static_cast<size_t>(clause->fContext.value); i-- > 0;) {
    if (IsClosingBracket(toks[i].code)) ++depth;
    if (!IsOpeningBracket(toks[i].code) || depth-- > 0) continue;
    const size_t first = NextSignificant(toks, i + 1, toks.size());
    met_doubtful_ |= toks[i].code == tok::LBRACE && first < toks.size() && toks[first].code == tok::DOUBLESTAR;
    return;
  }
}

void CNodeWalker::DoubtNamedArguments(const UsedArgList& arg_list) {
  bool has_keyword = false;
  bool has_star = false;
  NamesBefore names;
  for (size_t i = 0; i < arg_list.size(); ++i) {
    const CArgInfo& arg = arg_list[i];
    const size_t stars = arg.prefix.size();
    if (arg.name == nullptr && stars == 0) {
      // In front of Python 3 a star comes last.
      met_doubtful_ |= has_keyword || (has_star && !fPy3);
      continue;
    }
    met_doubtful_ |= stars == 1 && has_keyword;
    // And two of them come last of all.
    met_doubtful_ |= !fPy3 && i > 0 && arg_list[i - 1].prefix.size() == 2;
    has_star |= stars == 1;
    has_keyword |= arg.name != nullptr || stars == 2;
    if (arg.name == nullptr) continue;
    if (!isa<CNameLiteral>(arg.name) || IsConstant(arg.name->code)) {
      met_doubtful_ = true;
      continue;
    }
    const Text name = arg.name->fText();
    if (names.MayHold(name)) {
      for (size_t j = 0; j < i; ++j)
        if (arg_list[j].name != nullptr && arg_list[j].name->fText() == name) met_doubtful_ = true;
    }
    // A source with hundreds of arguments is asked once and not squared.
    if (i > 64) {
      met_doubtful_ = true;
      return;
    }
  }
}

void CNodeWalker::DoubtParameters(const ArgList& arg_list) {
  bool has_default = false;
  bool behind_star = false;
  NamesBefore names;
  for (size_t i = 0; i < arg_list.size(); ++i) {
    const ArgEntry& entry = arg_list[i];
    if (entry.is_list || i > 64) {
      met_doubtful_ = true;
      return;
    }
    const CArgInfo& arg = entry.arg;
    behind_star |= !arg.prefix.empty();
    if (arg.value != nullptr)
      has_default = true;
    else if (has_default && !behind_star)
      met_doubtful_ = true;
    if (arg.name == nullptr) continue;
    const Text name = arg.name->fText();
    met_doubtful_ |= IsConstant(arg.name->code) || IsDebugName(name);
    if (!names.MayHold(name)) continue;
    for (size_t j = 0; j < i; ++j)
      if (!arg_list[j].is_list && arg_list[j].arg.name != nullptr && arg_list[j].arg.name->fText() == name)
        met_doubtful_ = true;
  }
}

}  // namespace quillet
