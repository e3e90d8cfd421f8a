// Nodes on their way into a tree: given back to their pool unless the tree was finished.
//
// A hand-written parser may fail between making a node and hanging it into its parent; what it held
// until then must not stay out of recycling.
#pragma once

#include <utility>

#include "tree/node_pool.h"
#include "tree/nodes.h"

namespace quillet {

class OwnedNodes {
 public:
  explicit OwnedNodes(NodePool& pool) : pool_(pool) {}
  OwnedNodes(const OwnedNodes&) = delete;
  OwnedNodes& operator=(const OwnedNodes&) = delete;
  ~OwnedNodes() {
    for (CNode* node : nodes_) pool_.Reclaim(node);
  }

  void Add(CNode* node) { nodes_.push_back(node); }
  void Add(NodeList nodes) { nodes_.insert(nodes_.end(), nodes.begin(), nodes.end()); }
  const NodeList& nodes() const { return nodes_; }
  NodeList Release() { return std::exchange(nodes_, {}); }

 private:
  NodePool& pool_;
  NodeList nodes_;
};

}  // namespace quillet
