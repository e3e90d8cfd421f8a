// How nodes come into use and how a tree goes back.
//
// The order of a discard is part of the contract, since the free lists are last in, first out: a
// node is pushed before its children are looked at, so a child of the same state comes off the list
// before its parent. The descent is recursive and bounded; what lies below the bound keeps its
// fields, as a host may still look at it, and is reclaimed by the pool later.
#include "tree/factory.h"

#include <utility>

#include "foundations/console.h"

namespace quillet {
namespace {

constexpr int64_t kMaxDiscardDepth = 100;
constexpr int64_t kMinDiscardDepth = -900;

void PushFree(CNodeClassInfo* cls_info, CNode* node) {
  node->fNextFree = cls_info->fFirstFree;
  cls_info->fFirstFree = node;
}

void Discard(CNode* node, int64_t depth) {
  if (depth > kMaxDiscardDepth) [[unlikely]] {
    PrintLine("depth too great");
    if (node != nullptr) node->pool->Abandon(node);
    return;
  }
  if (node == nullptr) [[unlikely]]
    ThrowNoAttribute("fClsInfo");
  NodePool* pool = node->pool;
  CNodeClassInfo* cls_info = node->fClsInfo;
  if (cls_info != nullptr) PushFree(cls_info, node);
  if (node->has_children) {
    // The count is read anew each time: a tree that was given back twice may hold itself.
    for (uint32_t i = 0; i < node->child_count; ++i) {
      CNode* child = node->children[i];
      // Most children are leaves and need no call; all else, failures too, is for the call.
      if (child != nullptr && !child->has_children && child->fClsInfo != nullptr && depth < kMaxDiscardDepth)
          [[likely]] {
        PushFree(child->fClsInfo, child);
        child->pool->WipeLeafFields(child);
      } else {
        Discard(child, depth + 1);
      }
    }
    pool->ClearChildren(node);
  }
  pool->WipeLeafFields(node);
  if (cls_info == nullptr) pool->KeepForReuse(node);
}

}  // namespace

void FinishedWithNode(CNode* node) { FinishedWithNodeAtDepth(node, 0); }

void FinishedWithNodeAtDepth(CNode* node, int64_t depth) {
  if (node != nullptr) node->pool->ReclaimWaiting();
  Discard(node, std::max(depth, kMinDiscardDepth));
}

void KeywordSet::Add(Text keyword) {
  enabled = true;
  const TokenCode code = CodeOfName(keyword.data(), keyword.size());
  if (IsWordCode(code)) {
    by_code[code] = true;
  } else {
    others.emplace(keyword);
  }
}

CNodeFactory::CNodeFactory(Ref<NodePool> pool, std::span<const State> states, KeywordSet keywords,
                           std::unordered_map<std::string, int> op_text2number)
    : pool_(std::move(pool)), keywords_(std::move(keywords)), op_text2number_(std::move(op_text2number)) {
  class_infos_.reserve(states.size());
  for (const State& state : states) {
    class_infos_.push_back(pool_->NewClassInfo(state.kind, static_cast<int32_t>(class_infos_.size()), state.name));
  }
  if (keywords_.enabled) {
    keyword_class_info_ = pool_->NewClassInfo(NodeKind::kCKeywordLiteral, tok::NAME, "KEYWORD");
  }
}

CNodeClassInfo* CNodeFactory::RecordFromEnd(int32_t nodetype) const {
  const int64_t index = nodetype + static_cast<int64_t>(class_infos_.size());
  if (nodetype >= 0 || index < 0) ThrowError(ErrorKind::kIndexError, "list index out of range");
  return class_infos_[index];
}

CNode* CNodeFactory::ConvertSingleNode(int32_t nodetype, Text text, Context context, CNode* const* children,
                                       uint32_t child_count) {
  // A rule's lone child is passed through by the parser and never comes here.
  Assert(children == nullptr || child_count >= 2, "");
  const TokenCode code = IsNone(text) ? tok::REMOVED : CodeOfText(text);
  CNodeClassInfo* cls_info = RecordForToken(nodetype, text, code);
  if (IsNone(text) && children != nullptr && IsStatementAndLineEnd(children, child_count)) {
    DiscardNodes(children[1]);
    pool_->ReleaseContext(context);
    return children[0];
  }
  return NewNode(cls_info, text, code, context, children, child_count);
}

CNode* CNodeFactory::NewKeywordNode(Text text, Context context) {
  return NewNode(keyword_class_info_, text, context, nullptr, 0);
}

CNode* CNodeFactory::NewNameNode(Text text, Context context) {
  return NewNode(RecordForState(tok::NAME), text, context, nullptr, 0);
}

CNode* CNodeFactory::CreateOperatorNode(Text op_str, Context context) {
  const auto found = op_text2number_.find(std::string(op_str));
  if (found == op_text2number_.end()) return nullptr;
  return NewNode(RecordForState(found->second), op_str, context, nullptr, 0);
}

void CNodeFactory::SetChildren(CNode* node, std::span<CNode* const> children) {
  std::copy(children.begin(), children.end(), pool_->ResizeChildren(node, static_cast<uint32_t>(children.size())));
}

CNode* CNodeFactory::PopChild(CNode* node, uint32_t index) {
  CNode* child = node->ChildAt(index);
  std::copy(node->children + index + 1, node->children + node->child_count, node->children + index);
  --node->child_count;
  return child;
}

void CNodeFactory::DiscardNodes(CNode* node) { FinishedWithNode(node); }

}  // namespace quillet
