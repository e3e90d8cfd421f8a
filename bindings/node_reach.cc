// What pools keep on account of wrappers, and the search for what no wrapper reaches any more. See node_registry.h.
//
// A search follows all wrappers down their trees, so it is done once for so many things that may be found to be out of
// reach that it costs little for each.
#include <utility>

#include "bindings/node_registry.h"

namespace quillet::host {

class NodeRegistry::Reach {
 public:
  explicit Reach(const NodeRegistry& registry) {
    for (const auto& [node, ref] : registry.live_) Mark(node);
    for (const std::vector<CNode*>& nodes : LoneBareNodes()) {
      for (CNode* node : nodes) Mark(node);
    }
    for (size_t i = 0; i < nodes_.size(); ++i) {
      for (CNode* child : nodes_[i]->fChildren()) {
        if (child != nullptr) Mark(child);
      }
    }
  }
  ~Reach() {
    for (CNode* node : nodes_) node->is_reached = false;
  }
  Reach(const Reach&) = delete;
  Reach& operator=(const Reach&) = delete;

  const std::vector<CNode*>& nodes() const { return nodes_; }

 private:
  void Mark(CNode* node) {
    if (node->is_reached) return;
    node->is_reached = true;
    nodes_.push_back(node);
  }

  std::vector<CNode*> nodes_;
};

void NodeRegistry::Tidy(NodePool* pool) {
  const Operation operation;  // contexts and lists go when the search is over
  std::vector<ListMap::node_type> lists;
  {
    const Reach reach(*this);
    const size_t reached = reach.nodes().size();
    std::vector<CNode*> unreached;
    for (CNode* node : order_) {
      if (!node->is_reached) unreached.push_back(node);
    }
    for (CNode* node : unreached) lists.push_back(TakeList(node));
    orphans_ = 0;
    orphan_limit_ = std::max(kFewOrphans, reached / 16);
    if (pool != nullptr) {
      if (auto kept = kept_.find(pool); kept != kept_.end()) {
        DropUnusedSources(kept->second, reach);
        kept->second.sweep_at = std::max({kFewSources, kept->second.sources.size() * 2, reached / 16});
      }
      pool->TakeBackStrays(reached);
    }
  }
  for (const ListMap::node_type& list : lists) EndView(list.mapped().pool);
  if (!lists.empty()) LetGo(std::move(lists));
}

void NodeRegistry::TidyBeforeParse(NodePool* pool) {
  auto kept = kept_.find(pool);
  const bool has_many_sources = kept != kept_.end() && kept->second.sources.size() >= kept->second.sweep_at;
  if ((has_many_sources || pool->MayHoldStrays()) && !IsAnotherUnderWay()) Tidy(pool);
}

// Drops the sources that no node in reach of a wrapper refers to.
void NodeRegistry::DropUnusedSources(Kept& kept, const Reach& reach) {
  std::sort(kept.sources.begin(), kept.sources.end(),
            [](const auto& a, const auto& b) { return a->begin() < b->begin(); });
  std::vector<bool> used(kept.sources.size());
  for (const CNode* node : reach.nodes()) {
    if (node->text == nullptr) continue;
    auto after = std::upper_bound(kept.sources.begin(), kept.sources.end(), node->text,
                                  [](const char* text, const auto& source) { return text < source->begin(); });
    if (after == kept.sources.begin()) continue;
    const size_t index = static_cast<size_t>(after - kept.sources.begin()) - 1;
    if (kept.sources[index]->Holds(node->text)) used[index] = true;
  }
  size_t left = 0;
  for (size_t i = 0; i < kept.sources.size(); ++i) {
    if (used[i]) std::swap(kept.sources[left++], kept.sources[i]);
  }
  kept.sources.resize(left);
}

void NodeRegistry::Pin(NodePool* pool, const Ref<SourceText>& source) {
  Kept& kept = kept_[pool];
  if (!kept.sources.empty() && kept.sources.back().get() == source.get()) return;
  kept.sources.push_back(source);
}

void NodeRegistry::RehomeTexts(NodePool& pool) {
  const Reach reach(*this);
  for (CNode* node : reach.nodes()) {
    if (node->pool == &pool && node->text != nullptr) node->text = pool.Intern(node->fText()).data();
  }
}

void NodeRegistry::MakeSafe(CNode* node) {
  if ((node->text == nullptr && !node->has_children) || Find(node) != nullptr) return;
  const bool is_reached = [&] {
    const Reach reach(*this);
    return bool{node->is_reached};
  }();
  if (!is_reached) {
    node->pool->ClearChildren(node);
    node->pool->WipeLeafFields(node);
    return;
  }
  // It is in a tree whose source is not known here.
  std::unordered_map<SourceText*, Ref<SourceText>> sources;
  for (const auto& [other, ref] : live_) {
    if (ref->source_) sources.emplace(ref->source_.get(), ref->source_);
  }
  for (const auto& [key, source] : sources) Pin(node->pool, source);
}

// ---- pools that keep pools ----

// Drops what a pool without wrappers keeps, unless a pool that wrappers may reach keeps it, and so on for the pools it
// kept.
void NodeRegistry::LetGoOf(NodePool* pool) {
  std::vector<KeptMap::node_type> dropped;
  std::vector<NodePool*> pending{pool};
  while (!pending.empty()) {
    auto found = kept_.find(pending.back());
    pending.pop_back();
    if (found == kept_.end() || found->first->host_views != 0) continue;
    if (found->second.holders == 0) {
      for (const auto& [other, ref] : found->second.pools) {
        --kept_.find(other)->second.holders;
        pending.push_back(other);
      }
      Drop(found, dropped);
    } else {
      ++suspects_;
    }
  }
  // Pools may keep each other in a ring. To look for one takes a pass over all of them, so it is done once for so many
  // that may be in one.
  if (suspects_ * 16 >= kept_.size() + 1) DropRings(dropped);
  if (!dropped.empty()) LetGo(std::move(dropped));
}

// Drops all that no pool with wrappers keeps.
void NodeRegistry::DropRings(std::vector<KeptMap::node_type>& dropped) {
  suspects_ = 0;
  std::vector<Kept*> pending;
  for (auto& [pool, kept] : kept_) {
    kept.is_marked = pool->host_views != 0;
    if (kept.is_marked) pending.push_back(&kept);
  }
  while (!pending.empty()) {
    const Kept& kept = *pending.back();
    pending.pop_back();
    for (const auto& [other, ref] : kept.pools) {
      Kept& next = kept_.find(other)->second;
      if (!std::exchange(next.is_marked, true)) pending.push_back(&next);
    }
  }
  for (auto at = kept_.begin(); at != kept_.end();) {
    auto found = at++;
    if (found->second.is_marked) continue;
    for (const auto& [other, ref] : found->second.pools) {
      if (auto kept = kept_.find(other); kept != kept_.end()) --kept->second.holders;
    }
    Drop(found, dropped);
  }
}

// Takes an entry out. The nodes that have children of other pools lose them: they may stand on a free list, where a
// host can find them again.
void NodeRegistry::Drop(KeptMap::iterator found, std::vector<KeptMap::node_type>& dropped) {
  NodePool* pool = found->first;
  for (CNode* node : found->second.adopters) {
    const std::span<CNode* const> children = node->fChildren();
    if (std::any_of(children.begin(), children.end(),
                    [pool](const CNode* child) { return child != nullptr && child->pool != pool; }))
      pool->ClearChildren(node);
  }
  dropped.push_back(kept_.extract(found));
}

}  // namespace quillet::host
