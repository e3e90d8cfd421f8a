// CNodeFactory turns what the parser engine reduces into typed nodes and takes them back.
//
// A node is popped off the free list of its state, so that no memory is allocated for a statement
// like one seen before. What decides the state is in ConvertSingleNode; the fields are set here and
// nowhere else. A tree is given back once, through FinishedWithNode.
#pragma once

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
  std::unordered_map<std::string, bool> others;
  std::function<bool(Text)> host_lookup;

  void Add(Text keyword);
  bool Contains(Text text, TokenCode code) const {
    if (host_lookup) [[unlikely]] return host_lookup(text);
    if (IsWordCode(code)) return by_code[code];
    return !others.empty() && others.contains(std::string(text));
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
  // does not exist; AttributeError where no keyword record exists but one is needed.
  CNode* ConvertSingleNode(int32_t nodetype, Text text, Context context, CNode* const* children,
                           uint32_t child_count);

  // The two halves of the above for the parser's own use: a token whose code is known, and a rule
  // with at least two children.
  CNode* ConvertToken(int32_t nodetype, const Token& token, int32_t context);
  CNode* ConvertRule(int32_t nodetype, CNode* const* children, uint32_t child_count);

  CNode* NewNode(CNodeClassInfo* cls_info, Text text, TokenCode code, Context context, CNode* const* children,
                 uint32_t child_count);
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

  CNodeClassInfo* class_info(size_t state) const { return class_infos_[state]; }
  size_t state_count() const { return class_infos_.size(); }
  CNodeClassInfo* keyword_class_info() const { return keyword_class_info_; }
  const KeywordSet& keywords() const { return keywords_; }
  const std::unordered_map<std::string, int>& op_text2number() const { return op_text2number_; }
  NodePool& pool() const { return *pool_; }
  const Ref<NodePool>& pool_ref() const { return pool_; }

 private:
  Ref<NodePool> pool_;
  std::vector<CNodeClassInfo*> class_infos_;
  CNodeClassInfo* keyword_class_info_ = nullptr;
  KeywordSet keywords_;
  std::unordered_map<std::string, int> op_text2number_;
};

// Gives a whole tree back to the free lists: parent before children, children first to last. More
// than 100 levels down "depth too great" is printed and that part is not recycled. A null child is
// an AttributeError, a null `node` too.
void FinishedWithNode(CNode* node);
void FinishedWithNodeAtDepth(CNode* node, int64_t depth);

}  // namespace quillet
