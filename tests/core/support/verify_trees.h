// What holds for every tree, free list and record, whatever the statement. Each check returns what is
// wrong, empty where nothing is.
#pragma once

#include <string>
#include <unordered_set>
#include <vector>

#include "lines/logical_line.h"
#include "tree/factory.h"
#include "tree/nodes.h"

namespace quillet {

// A tree of a parser: leaves have text and no children, other nodes no text and children, two at
// least where an engine made them; a node's class is its record's; no node stands in two places; token
// indices lie within the line and, in the tree of one feed, never go back from left to right.
inline std::string VerifyTree(const CNode* root, const CNodeFactory& factory, int32_t token_count) {
  std::unordered_set<const CNode*> seen;
  std::vector<const CNode*> stack{root};
  int32_t last_index = 0;
  // Guards and bodies count their tokens anew, and type parameters stand in front of their statement.
  bool is_ordered = true;
  while (!stack.empty()) {
    const CNode* node = stack.back();
    stack.pop_back();
    if (node == nullptr) return "an absent node";
    if (!seen.insert(node).second) return "a node in two places";
    if (node->fClsInfo != nullptr) {
      if (node->kind != node->fClsInfo->kind) return "a node of another class than its record's";
      const size_t state = static_cast<size_t>(node->fClsInfo->fNodeType);
      if (node->fClsInfo != factory.keyword_class_info() &&
          (state >= factory.state_count() || factory.class_info(state) != node->fClsInfo))
        return "a record of no state";
    }
    if (isa<CCaseStmt>(node) || isa<CMatchStmt>(node) || isa<CWithTypeParameters>(node)) is_ordered = false;
    if (node->IsLeaf()) {
      if (node->has_children || node->child_count != 0) return "a leaf with children";
      if (node->code == tok::REMOVED) return "a leaf without a code";
      const Context context = node->fContext;
      if (context.IsIndex()) {
        if (context.value < 0 || context.value > token_count) return "a token index outside the line";
        if (is_ordered && context.value < last_index) return "token indices that go back";
        last_index = context.value;
      } else if (!context.IsPosition()) {
        return "a leaf without a place";
      }
      continue;
    }
    if (!node->has_children) return "a node with neither text nor children";
    if (node->fClsInfo != nullptr && node->child_count < 2) return "a rule with fewer than two children";
    if (node->child_count > node->child_capacity) return "more children than room";
    for (uint32_t i = node->child_count; i-- > 0;) stack.push_back(node->children[i]);
  }
  return "";
}

// Every list holds wiped nodes of its own record, each once.
inline std::string VerifyFreeLists(const CNodeFactory& factory) {
  std::unordered_set<const CNode*> seen;
  const auto verify = [&seen](const CNodeClassInfo* record) -> std::string {
    for (const CNode* node = record->fFirstFree; node != nullptr; node = node->fNextFree) {
      if (!seen.insert(node).second) return "a node twice on the free lists";
      if (node->fClsInfo != record) return "a node on another record's free list";
      if (node->text != nullptr || node->child_count != 0 || node->has_children) return "a free node with content";
    }
    return "";
  };
  for (size_t i = 0; i < factory.state_count(); ++i)
    if (std::string wrong = verify(factory.class_info(i)); !wrong.empty()) return wrong;
  return factory.keyword_class_info() != nullptr ? verify(factory.keyword_class_info()) : "";
}

// A line of an embedded expression: tokens in order, within the bytes of the outer line's source, and
// no earlier than it.
inline std::string VerifyEmbedded(const LogicalLine& outer, const LogicalLine& exp) {
  if (exp.toks.empty()) return "an embedded line without tokens";
  if (exp.token_count != static_cast<int32_t>(exp.toks.size())) return "an embedded line with a wrong count";
  if (exp.first_line < outer.first_line) return "an embedded line in front of its line";
  const char* end = outer.source->begin();
  for (size_t i = 0; i < exp.toks.size(); ++i) {
    const Token& token = exp.toks[i];
    if (token.text < end || token.length == 0) return "embedded tokens that overlap";
    end = token.end();
    const Position position = exp.positions()[i];
    if (position.line < 0 || position.col < 0) return "an embedded token in front of its line";
    if (i == 0 && position.line != 0) return "an embedded line that begins on another line";
  }
  return end <= outer.source->end() ? "" : "an embedded token behind the source";
}

}  // namespace quillet
