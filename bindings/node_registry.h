// All live wrappers of nodes, the lists of children that hosts hold, and what pools keep alive on their account.
// Guarded by the interpreter lock.
//
// Letting go of a list or of a pool may run any code of the host's, which comes back here. So what goes is first taken
// out of the tables and given up when nothing else is left to do.
#pragma once

#include <algorithm>
#include <array>
#include <unordered_map>
#include <unordered_set>
#include <vector>

#include "bindings/bindings.h"
#include "bindings/host_call.h"
#include "bindings/node_ref.h"
#include "lines/source_text.h"
#include "tree/node_pool.h"
#include "tree/nodes.h"

namespace quillet::host {

class NodeRegistry {
 public:
  static NodeRegistry& Get();

  // ---- wrappers ----
  void Add(NodeRef* ref);
  // The wrapper is going: it must not be handed out any more.
  void Forget(NodeRef* ref);
  // One wrapper or list less through which the host sees the pool.
  void EndView(const Ref<NodePool>& pool);
  NodeRef* Find(CNode* node) const {
    auto found = live_.find(node);
    return found == live_.end() || found->second->kind_ != node->kind ? nullptr : found->second;
  }
  // The wrapper again, for a node whose texts stand in `source` now.
  nb::object Reuse(NodeRef* ref, const Ref<SourceText>& source);

  // ---- the host's lists of children (node_registry.cc) ----
  // A list belongs to the wrapper of its node, which shows it to the collector. One whose wrapper went and that the
  // host still holds waits for the next wrapper, as long as any wrapper reaches the node.

  // The list that the host holds of the node's children, if the core left the node alone since.
  nb::object ListOf(CNode* node);
  // The same as it stands, for the collector; null without one.
  PyObject* PeekList(const CNode* node) const;
  // Makes a list that has these children of the node, which has no list yet, the host's own.
  void KeepList(CNode* node, const Ref<SourceText>& source, nb::object list, std::vector<CNode*> nodes);
  // Takes a list out of the tables. It goes with the result, and with it wrappers, which find the registry as it is
  // to be.
  struct HostList {
    nb::object list;
    std::vector<CNode*> synchronised;  // what list and node had in common last
    Ref<NodePool> pool;
    Ref<SourceText> source;
    size_t place;  // in order_
  };
  using ListMap = std::unordered_map<const CNode*, HostList>;
  ListMap::node_type TakeList(const CNode* node);
  void DropList(const CNode* node);
  // Takes over what the host changed in its list of the node's children; TypeError for what is no node.
  void Synchronise(CNode* node);
  // Brings the lists of the node and of all nodes below it up to date, in time bounded by the lesser of what there is
  // below it and what the host holds.
  void SynchroniseBelow(CNode* root);
  // Lets go of lists that nobody else holds, a few at each call: by the time that there are many, there were as many
  // calls.
  void DropSomeUnheld();
  // The wrapper that the list belongs to goes.
  void LeaveList(CNode* node) {
    if (!lists_.empty()) LeaveAnyList(node);
  }

  // ---- what pools keep (node_reach.cc) ----
  // Keeps a source that nodes of the pool refer to, or are about to.
  void Pin(NodePool* pool, const Ref<SourceText>& source);
  // Gives the texts of all nodes that wrappers of the pool may reach to the pool.
  void RehomeTexts(NodePool& pool);
  // Makes a node that no wrapper showed so far safe to show: what no wrapper reaches has texts and children that may be
  // gone.
  void MakeSafe(CNode* node);
  // At the start of an operation that makes nodes of the pool: lets go of what no wrapper reaches, where there may be
  // much of it and no other operation is under way.
  void TidyBeforeParse(NodePool* pool);

 private:
  // What a pool's nodes refer to outside of it. It stays as long as a wrapper may reach the pool.
  struct Kept {
    std::vector<Ref<SourceText>> sources;
    std::unordered_map<NodePool*, Ref<NodePool>> pools;
    std::unordered_set<CNode*> adopters;  // nodes of the pool that were given children of others
    size_t holders = 0;                   // pools that keep this one
    size_t sweep_at = kFewSources;
    bool is_marked = false;
  };
  using KeptMap = std::unordered_map<NodePool*, Kept>;
  // All nodes that a host may get at from its wrappers, marked as reached as long as it lives.
  class Reach;

  static constexpr size_t kFewSources = 64;
  static constexpr size_t kFewOrphans = 16;

  void LeaveAnyList(CNode* node);
  static bool IsCurrent(const CNode* node, const HostList& kept);
  bool TrySynchronise(CNode* node);
  bool SynchroniseTree(CNode* root, size_t most);
  CNode* Adopt(CNode* parent, const HostList& kept, nb::handle item);
  // Looks for lists, and for sources and nodes of the pool (null: of none), that no wrapper reaches, and lets go of
  // them. To be called while nothing works with nodes.
  void Tidy(NodePool* pool);
  void LetGoOf(NodePool* pool);
  void DropRings(std::vector<KeptMap::node_type>& dropped);
  void Drop(KeptMap::iterator found, std::vector<KeptMap::node_type>& dropped);
  void DropUnusedSources(Kept& kept, const Reach& reach);

  std::unordered_map<CNode*, NodeRef*> live_;
  ListMap lists_;
  std::vector<CNode*> order_;  // the nodes of lists_
  size_t next_to_check_ = 0;   // in order_, see DropSomeUnheld
  size_t held_items_ = 0;      // of all lists, when they were synchronised last
  size_t orphans_ = 0;         // lists that lost their wrapper, since the last look for those that nobody reaches
  size_t orphan_limit_ = kFewOrphans;
  KeptMap kept_;
  size_t suspects_ = 0;  // pools without wrappers that others keep, found since the last DropRings
};

// Nodes without a record that a host made and let go of before they had a place in a tree, by kind.
std::array<std::vector<CNode*>, kNodeKindCount>& LoneBareNodes();

}  // namespace quillet::host
