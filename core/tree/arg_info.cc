// Parameters of a definition and arguments of a call as flat lists.
//
// A list of one has collapsed to its element, and the two grammars spell parameters differently: the
// annotation, the default and the star are nodes of their own here and leaves between commas there.
// So a list is read leaf by leaf into a current record, which a comma ends. Tuple parameters nest
// as deep as the source likes; the levels around the one being read are kept on a heap stack.
#include "tree/arg_info.h"

#include "tree/nodes.h"

namespace quillet {
namespace {

Text StarPrefix(TokenCode code) {
  if (code == tok::STAR) return "*";
  return code == tok::DOUBLESTAR ? Text("**") : kNoText;
}

// More than a source nests, and memory that a tree which a host closed to a ring may take.
constexpr size_t kMaxNestedLists = size_t{1} << 20;

std::string ReprOfTextOf(const CNode* node) { return node->IsLeaf() ? ReprOfText(node->fText()) : "None"; }

// One list of parameters while it is read.
struct Level {
  const CNode* list = nullptr;  // null: there is nothing to read but what Enter found
  uint32_t next = 0;
  CArgInfo current;
  bool default_follows = false;
  bool annotation_follows = false;
  ArgList entries;

  // Takes up a node; returns a list nested in it, which is its only entry, or null.
  CNode* Enter(CNode* node) {
    if (isa<CParametersNode>(node)) {
      if (node->child_count == 2) return nullptr;
      node = node->ChildAt(1);
    }
    if (isa<CDefiningArglistNode>(node)) {
      list = node;
      return nullptr;
    }
    if (const auto* parameter = dyn_cast<CFunctionParameterDef>(node)) {
      if (CNode* nested = parameter->GetNestedListNode()) return nested;
      SetFrom(parameter);
      entries.emplace_back(current);
      return nullptr;
    }
    if (node == nullptr) ThrowNoAttribute("fText");
    if (!isa<CNameLiteral>(node)) {
      std::string what = "(";
      what += ReprOfNode(node) + ", " + ReprOfTextOf(node) + ")";
      throw NotANameError(std::move(what), node);
    }
    current.name = node;
    entries.emplace_back(current);
    return nullptr;
  }

  // Reads on to the next nested list and returns it, or null at the end.
  CNode* ReadOn() {
    if (list == nullptr) return nullptr;
    while (next < list->child_count) {
      CNode* child = list->children[next++];
      if (const auto* parameter = dyn_cast<CFunctionParameterDef>(child)) {
        if (CNode* nested = parameter->GetNestedListNode()) return nested;
        SetFrom(parameter);
      } else {
        ReadPlain(child);
      }
    }
    if (current.name != nullptr || !IsNone(current.prefix)) entries.emplace_back(current);
    return nullptr;
  }

 private:
  void SetFrom(const CFunctionParameterDef* parameter) {
    current.name = parameter->GetName();
    current.type_expr = parameter->GetTypeExpr();
  }

  void ReadPlain(CNode* child) {
    if (child == nullptr) ThrowNoAttribute("fText");
    switch (child->code) {
      case tok::COMMA:
        // Behind "/" and behind a tuple parameter there is no record to end. A tuple's default was read
        // into it and must not become that of the next parameter.
        if (current.name != nullptr || !IsNone(current.prefix)) entries.emplace_back(current);
        current = CArgInfo();
        default_follows = false;
        annotation_follows = false;
        return;
      case tok::STAR:
      case tok::DOUBLESTAR:
        current.prefix = StarPrefix(child->code);
        return;
      case tok::EQUAL:
        default_follows = true;
        return;
      case tok::COLON:
        annotation_follows = true;
        return;
      case tok::SLASH:
        return;
      default:
        break;
    }
    if (default_follows) {
      current.value = child;
    } else if (annotation_follows) {
      current.type_expr = child;
    } else if (isa<CNameLiteral>(child)) {
      current.name = child;
    } else if (child->code != tok::LPAR && child->code != tok::RPAR) {
      std::string what = "Text is not ( or ): text = ";
      what += ReprOfTextOf(child) + ", type(child) = " + ReprOfKind(child->kind);
      ThrowError(ErrorKind::kAssertionError, std::move(what));
    }
  }
};

void SetFromArgument(const CSingleUsedArgumentNode* argument, CArgInfo& info) {
  info.prefix = argument->GetPrefix();
  info.name = argument->GetName();
  info.value = argument->GetValue();
}

}  // namespace

void ArgEntry::DropNested(std::vector<ArgEntry>& nested) {
  std::vector<std::vector<ArgEntry>> pending;
  pending.push_back(std::move(nested));
  while (!pending.empty()) {
    std::vector<ArgEntry> list = std::move(pending.back());
    pending.pop_back();
    for (ArgEntry& entry : list) {
      if (!entry.list.empty()) pending.push_back(std::move(entry.list));
    }
  }
}

void GetDefiningArgInfoList(CNode* node, ArgList& out) {
  out.clear();
  std::vector<Level> around;
  Level level;
  level.entries = std::move(out);
  CNode* nested = level.Enter(node);
  while (true) {
    if (nested == nullptr) nested = level.ReadOn();
    if (nested != nullptr) {
      if (around.size() == kMaxNestedLists) ThrowTooDeep();
      around.push_back(std::move(level));
      level = Level();
      nested = level.Enter(nested);
      continue;
    }
    if (around.empty()) break;
    ArgEntry list(std::move(level.entries));
    level = std::move(around.back());
    around.pop_back();
    level.entries.push_back(std::move(list));
  }
  out = std::move(level.entries);
}

ArgList GetDefiningArgInfoList(CNode* node) {
  ArgList list;
  GetDefiningArgInfoList(node, list);
  return list;
}

void GetUsedArgInfoList(CNode* node, UsedArgList& out) {
  out.clear();
  CArgInfo current;
  if (isa<CUsedArglistNode>(node) || isa<CTestListStarExpr>(node)) {
    for (CNode* child : node->fChildren()) {
      if (child == nullptr) ThrowNoAttribute("fText");
      if (child->code == tok::COMMA) {
        out.push_back(current);
        current = CArgInfo();
      } else if (child->code == tok::STAR || child->code == tok::DOUBLESTAR) {
        current.prefix = StarPrefix(child->code);
      } else if (const auto* argument = dyn_cast<CSingleUsedArgumentNode>(child)) {
        SetFromArgument(argument, current);
      } else {
        current.value = child;
      }
    }
    if (current.value != nullptr) out.push_back(current);
    return;
  }
  if (const auto* argument = dyn_cast<CSingleUsedArgumentNode>(node)) {
    // Meant: a lone argument gives no prefix, so `f(*a)` has none and its value is the whole node.
    current.name = argument->GetName();
    current.value = argument->GetValue();
  } else {
    current.value = node;
  }
  out.push_back(current);
}

UsedArgList GetUsedArgInfoList(CNode* node) {
  UsedArgList list;
  GetUsedArgInfoList(node, list);
  return list;
}

const CNode* LastLeaf(const CNode* node) {
  DescentBound bound;
  while (node->child_count != 0) {
    bound.Step();
    node = node->LastChild();
    if (node == nullptr) ThrowNoAttribute("GetChildCount");
  }
  return node;
}

int64_t GetTokenEndIndex(const CNode* node) {
  node = LastLeaf(node);
  if (!node->fContext.IsIndex()) {
    ThrowError(ErrorKind::kTypeError, node->fContext.IsNone()
                                          ? "unsupported operand type(s) for +: 'NoneType' and 'int'"
                                          : "the context of the node's last leaf is no token index");
  }
  return int64_t{node->fContext.value} + 1;
}

// ---- one argument, one parameter ----

Text CSingleUsedArgumentNode::GetPrefix() const {
  CNode* first = ChildAt(0);
  if (first == nullptr) ThrowNoAttribute("fText");
  return StarPrefix(first->code);
}

CNode* CSingleUsedArgumentNode::GetName() const { return ChildAtIs(1, tok::EQUAL) ? children[0] : nullptr; }

// The node itself where there is no "=": for a bare generator expression, `*x` and `**x` too.
CNode* CSingleUsedArgumentNode::GetValue() const {
  return ChildAtIs(1, tok::EQUAL) ? ChildAt(2) : const_cast<CSingleUsedArgumentNode*>(this);
}

bool CSingleUsedArgumentNode::IsUnparenthesizedGenExpr() const {
  return child_count == 2 && isa<CCompForNode>(children[1]);
}

CNode* CSingleUsedArgumentNode::GetNameAssigned() const {
  return ChildAtIs(1, tok::COLONEQUAL) ? GetChild(0) : nullptr;
}

CNode* CSingleUsedArgumentNode::GetNamedRightHandExpression() const {
  return ChildAtIs(1, tok::COLONEQUAL) ? GetChild(2) : nullptr;
}

CNode* CFunctionParameterDef::GetNestedListNode() const {
  return child_count == 3 && ChildIs(0, tok::LPAR) ? children[1] : nullptr;
}

CNode* CFunctionParameterDef::GetName() const { return GetNestedListNode() != nullptr ? nullptr : GetChild(0); }

CNode* CFunctionParameterDef::GetTypeExpr() const {
  return child_count == 3 && ChildIs(1, tok::COLON) ? children[2] : nullptr;
}

}  // namespace quillet
