// CNodeFactory turns what the parser engine reduces into typed nodes and takes them back.
//
// A node is popped off the free list of its state, so that no memory is allocated for a statement
// like one seen before. What decides the state is in ConvertSingleNode; the fields are set here and
// nowhere else. A tree is given back once, through FinishedWithNode.
#pragma once

#include <algorithm>
#include <functional>
#include <span>
#include <string>
#include <unordered_map>
#include <vector>

#include "tree/node.h"
#include "tree/node_pool.h"

namespace quillet {

// Words that become keyword leaves. For the words of words.def a bit by code; any other keyword a
// host names is looked up by text. `host_lookup`, where set, replaces both: the host handed in a
// dict of its own, which is read as it is at each call.
struct KeywordSet {
  bool enabled = false;  // false: no keywords at all
  bool by_code[256] = {};
  TextSet others;
  std::function<bool(Text)> host_lookup;

  // Adds a word and enables the set.
  void Add(Text keyword);
  bool Contains(Text text, TokenCode code) const {
    if (host_lookup) [[unlikely]]
      return host_lookup(text);
    if (IsWordCode(code)) return by_code[code];
    return !others.empty() && others.contains(text);
  }
};

class CNodeFactory {
 public:
  // One entry a state number: the class that serves it and the state's name (none if unknown).
  struct State {
    NodeKind kind;
    Text name;
  };

  // `states` is indexed by state number. `op_text2number` maps operator text to token number.
  CNodeFactory(Ref<NodePool> pool, std::span<const State> states, KeywordSet keywords,
               std::unordered_map<std::string, int> op_text2number);

  // The node for a reduced rule or a shifted token. `children` null: a leaf (the host's None).
  // A rule of two children whose second is a line end gives its first child, and the line end goes
  // back. With exactly one child or none in a list: AssertionError. IndexError for a state that
  // does not exist; AttributeError where no keyword record exists but one is needed. A context of
  // the host's belongs to the node afterwards.
  CNode* ConvertSingleNode(int32_t nodetype, Text text, Context context, CNode* const* children, uint32_t child_count);

  // The two halves of the above for the parser's own use: a token whose code is that of its text,
  // and a rule with at least two children, whose context becomes that of its first token.
  CNode* ConvertToken(int32_t nodetype, const Token& token, int32_t context);
  CNode* ConvertRule(int32_t nodetype, CNode* const* children, uint32_t child_count);

  // A node of the record's class off its free list. `children` null: a leaf; else they are copied.
  CNode* NewNode(CNodeClassInfo* cls_info, Text text, TokenCode code, Context context, CNode* const* children,
                 uint32_t child_count);
  CNode* NewNode(CNodeClassInfo* cls_info, Text text, Context context, CNode* const* children, uint32_t child_count) {
    return NewNode(cls_info, text, IsNone(text) ? tok::REMOVED : CodeOfText(text), context, children, child_count);
  }
  CNode* NewKeywordNode(Text text, Context context);
  CNode* NewNameNode(Text text, Context context);
  // Null for text that is no operator.
  CNode* CreateOperatorNode(Text op_str, Context context);

  // A node of a hand-written parser: a class without a record. Children are set with SetChildren.
  template <class T>
  T* NewBare() {
    return static_cast<T*>(pool_->Construct(NodeKindRange<T>::kFirst, nullptr));
  }
  void SetChildren(CNode* node, std::span<CNode* const> children);
  // Takes the child at `index` out of the list; the caller owns it then.
  CNode* PopChild(CNode* node, uint32_t index);

  void DiscardNodes(CNode* node);

  // The record of a state number; a negative number counts from the end, as in the host's lists.
  // IndexError for a number outside.
  CNodeClassInfo* RecordForState(int32_t nodetype) const {
    if (static_cast<uint32_t>(nodetype) < class_infos_.size()) [[likely]]
      return class_infos_[nodetype];
    return RecordFromEnd(nodetype);
  }
  // The record of a token: keywords, and AWAIT and ASYNC whatever their text, share one, which is
  // null for a factory without keywords.
  CNodeClassInfo* RecordForToken(int32_t nodetype, Text text, TokenCode code) const {
    if (nodetype == tok::NAME) {
      if (keywords_.Contains(text, code)) return keyword_class_info_;
    } else if (nodetype == tok::AWAIT || nodetype == tok::ASYNC) {
      return keyword_class_info_;
    }
    return RecordForState(nodetype);
  }

  CNodeClassInfo* class_info(size_t state) const { return class_infos_[state]; }
  size_t state_count() const { return class_infos_.size(); }
  CNodeClassInfo* keyword_class_info() const { return keyword_class_info_; }
  const KeywordSet& keywords() const { return keywords_; }
  const std::unordered_map<std::string, int>& op_text2number() const { return op_text2number_; }
  NodePool& pool() const { return *pool_; }
  const Ref<NodePool>& pool_ref() const { return pool_; }

 private:
  CNodeClassInfo* RecordFromEnd(int32_t nodetype) const;

  Ref<NodePool> pool_;
  std::vector<CNodeClassInfo*> class_infos_;
  CNodeClassInfo* keyword_class_info_ = nullptr;
  KeywordSet keywords_;
  std::unordered_map<std::string, int> op_text2number_;
};

// Gives a whole tree back to the free lists: parent before children, children first to last. More
// than 100 levels down "depth too great" is printed and that part is not recycled. A null child is
// an AttributeError, a null `node` too; what was given back by then stays so. A depth below -900
// counts as -900: the levels of one call are bounded by the machine stack.
void FinishedWithNode(CNode* node);
void FinishedWithNodeAtDepth(CNode* node, int64_t depth);

// ---- the innermost operations, a call for each token ----

// Pops a node off the free list of its record. fNextFree keeps its value: nothing reads it in a node
// that is in use.
inline CNode* TakeNode(CNodeClassInfo* cls_info) {
  if (cls_info == nullptr) [[unlikely]]
    ThrowNoAttribute("fFirstFree");
  CNode* node = cls_info->fFirstFree;
  if (node == nullptr) [[unlikely]]
    return cls_info->pool->Construct(cls_info->kind, cls_info);
  cls_info->fFirstFree = node->fNextFree;
  return node;
}

inline CNode* CNodeFactory::NewNode(CNodeClassInfo* cls_info, Text text, TokenCode code, Context context,
                                    CNode* const* children, uint32_t child_count) {
  CNode* node = TakeNode(cls_info);
  NodePool* pool = cls_info->pool;
  node->text = text.data();
  node->text_length = static_cast<uint32_t>(text.size());
  node->code = code;
  pool->SetContext(node, context);
  if (children != nullptr) {
    CNode** const own = pool->ResizeChildren(node, child_count);
    // Nearly all have two or three, for which a call takes longer than the copy.
    if (child_count >= 2) [[likely]] {
      own[0] = children[0];
      own[1] = children[1];
      if (child_count > 2) own[2] = children[2];
      if (child_count > 3) std::copy(children + 3, children + child_count, own + 3);
    } else {
      std::copy_n(children, child_count, own);
    }
  } else if (node->has_children) [[unlikely]] {
    pool->ClearChildren(node);  // left by a discard that failed at an absent child
  }
  return node;
}

// A small statement and its line end: the statement stands for the rule. The test is on the record's
// number, so that a node without a record is never taken for a line end.
inline bool IsStatementAndLineEnd(CNode* const* children, uint32_t child_count) {
  if (child_count != 2) return false;
  if (children[1] == nullptr) [[unlikely]]
    ThrowNoAttribute("fClsInfo");
  const CNodeClassInfo* second = children[1]->fClsInfo;
  return second != nullptr && second->fNodeType == tok::NEWLINE;
}

inline CNode* CNodeFactory::ConvertToken(int32_t nodetype, const Token& token, int32_t context) {
  return NewNode(RecordForToken(nodetype, token.view(), token.code), token.view(), token.code, Context::Index(context),
                 nullptr, 0);
}

inline CNode* CNodeFactory::ConvertRule(int32_t nodetype, CNode* const* children, uint32_t child_count) {
  CNodeClassInfo* cls_info = RecordForState(nodetype);
  if (IsStatementAndLineEnd(children, child_count)) {
    FinishedWithNode(children[1]);
    return children[0];
  }
  const Context context = children[0] == nullptr ? Context::None() : children[0]->fContext;
  return NewNode(cls_info, kNoText, tok::REMOVED, context, children, child_count);
}

}  // namespace quillet
