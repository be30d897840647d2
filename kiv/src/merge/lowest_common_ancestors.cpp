#include "kiv/merge/lowest_common_ancestors.h"

#include "history/commit_depths.h"
#include "history/history_support.h"
#include "history/path_order_walk.h"
#include "kiv/metamodel/commit_impl.h"

#include <algorithm>
#include <limits>
#include <optional>
#include <queue>
#include <unordered_map>
#include <utility>

namespace kiv::merge {

namespace {

using Key = const Commit::Impl*;  // null: a parent that is not resident, one node for all

constexpr std::size_t kUncounted = std::numeric_limits<std::size_t>::max();

std::size_t addUpTo(std::size_t a, std::size_t b, std::size_t cap) {
  return a >= cap - std::min(b, cap) ? cap : a + b;
}

std::size_t multiplyUpTo(std::size_t a, std::size_t b, std::size_t cap) {
  if (a == 0 || b == 0) return 0;
  return a > cap / b ? cap : std::min(a * b, cap);
}

// The commits behind `a` and `b`, with what the list is made of. Counts of walks stop
// growing at `cap`.
class CommonAncestry {
 public:
  CommonAncestry(const Commit& a, const Commit& b, std::size_t cap) : a_(a), cap_(cap) {
    gather(a);
    gather(b);
    markBehind(a.getImpl(), &Node::ofA);
    markBehind(b.getImpl(), &Node::ofB);
    measureHeights();
    for (const auto& [key, node] : nodes_) {
      if (node.ofA && node.ofB) depth_ = std::max(depth_, node.height);
    }
    if (depth_ == 0) return;
    walksFromB_ = countWalksFrom(b.getImpl());
    markWaysToDeepest();
  }

  bool unrelated() const { return depth_ == 0; }

  // How many entries the list holds, up to the cap.
  std::size_t listLength() const {
    const std::unordered_map<Key, std::size_t> walksFromA = countWalksFrom(a_.getImpl());
    const std::unordered_map<Key, std::size_t> longestWays = countLongestWaysBack();
    std::size_t length = 0;
    for (const Key key : byHeight_) {
      if (!isDeepest(key)) continue;
      const std::size_t ofThis = multiplyUpTo(multiplyUpTo(walksFromA.at(key), longestWays.at(key), cap_),
                                              walksFromB_.at(key), cap_);
      length = addUpTo(length, ofThis, cap_);
    }
    return length;
  }

  // The list's entries in order, until `wanted` are known; a commit is entered by at most
  // `walksPerCommit` of the paths of `a`.
  std::vector<Commit> entries(std::size_t wanted, std::size_t walksPerCommit) const {
    std::vector<Commit> list;
    std::vector<history::WalkStep> steps;
    const auto mayStep = [&](const Commit& from, const Commit& parent) {
      return mayGoOn(from.getImpl(), parent.getImpl());
    };
    const auto finish = [&](std::size_t at) {
      // The walk has come down one of the ancestor's longest ways: it is depth - 1 steps back.
      for (std::size_t back = 1; back < depth_; ++back) at = steps[at].previous;
      const Commit& ancestor = steps[at].commit;
      const std::size_t copies = std::min(walksFromB_.at(ancestor.getImpl()), wanted - list.size());
      list.insert(list.end(), copies, ancestor);
      return list.size() >= wanted;
    };
    history::walkInPathOrder(
        steps, a_, walksPerCommit, mayStep, [](std::size_t) { return false; }, finish);
    return list;
  }

 private:
  struct Node {
    Commit commit;
    std::vector<Key> parents;  // in order, a parent named twice twice
    std::size_t height = 0;    // commits on the longest path from here to its root
    bool ofA = false, ofB = false;
    bool leadsToDeepest = false;
  };

  void gather(const Commit& start) {
    std::vector<Commit> pending{start};
    while (!pending.empty()) {
      const Commit commit = std::move(pending.back());
      pending.pop_back();
      const auto [it, isNew] = nodes_.try_emplace(commit.getImpl());
      if (!isNew || !commit) continue;
      it->second.commit = commit;
      for (Commit& parent : history::parentsOf(commit)) {
        it->second.parents.push_back(parent.getImpl());
        pending.push_back(std::move(parent));
      }
    }
  }

  void markBehind(Key start, bool Node::*mark) {
    std::vector<Key> pending{start};
    while (!pending.empty()) {
      Node& node = nodes_.at(pending.back());
      pending.pop_back();
      if (node.*mark) continue;
      node.*mark = true;
      pending.insert(pending.end(), node.parents.begin(), node.parents.end());
    }
  }

  // Heights, children before parents; then every commit in ascending height.
  void measureHeights() {
    std::vector<std::pair<Key, bool>> stack;
    for (const auto& [key, node] : nodes_) stack.emplace_back(key, false);
    while (!stack.empty()) {
      const auto [key, parentsDone] = stack.back();
      stack.pop_back();
      Node& node = nodes_.at(key);
      if (node.height != 0) continue;
      if (!parentsDone) {
        stack.emplace_back(key, true);
        for (const Key parent : node.parents) {
          if (nodes_.at(parent).height == 0) stack.emplace_back(parent, false);
        }
        continue;
      }
      std::size_t tallest = 0;
      for (const Key parent : node.parents) tallest = std::max(tallest, nodes_.at(parent).height);
      node.height = tallest + 1;
    }
    byHeight_.reserve(nodes_.size());
    for (const auto& [key, node] : nodes_) byHeight_.push_back(key);
    std::sort(byHeight_.begin(), byHeight_.end(),
              [&](Key x, Key y) { return nodes_.at(x).height < nodes_.at(y).height; });
  }

  bool isDeepest(Key key) const {
    const Node& node = nodes_.at(key);
    return node.ofA && node.ofB && node.height == depth_;
  }

  // Walks from `start` to each commit behind it; a child is taller than its parents, so
  // descending height puts every commit after all its children.
  std::unordered_map<Key, std::size_t> countWalksFrom(Key start) const {
    std::unordered_map<Key, std::size_t> walks;
    walks[start] = 1;
    for (auto it = byHeight_.rbegin(); it != byHeight_.rend(); ++it) {
      const auto found = walks.find(*it);
      if (found == walks.end()) continue;
      const std::size_t here = found->second;
      for (const Key parent : nodes_.at(*it).parents) walks[parent] = addUpTo(walks[parent], here, cap_);
    }
    return walks;
  }

  // Per commit, how many of its ways back to a root are as long as its height.
  std::unordered_map<Key, std::size_t> countLongestWaysBack() const {
    std::unordered_map<Key, std::size_t> ways;
    for (const Key key : byHeight_) {
      const Node& node = nodes_.at(key);
      std::size_t count = node.parents.empty() ? 1 : 0;
      for (const Key parent : node.parents) {
        if (nodes_.at(parent).height + 1 == node.height) count = addUpTo(count, ways.at(parent), cap_);
      }
      ways[key] = count;
    }
    return ways;
  }

  void markWaysToDeepest() {
    for (const Key key : byHeight_) {
      Node& node = nodes_.at(key);
      node.leadsToDeepest =
          isDeepest(key) || std::any_of(node.parents.begin(), node.parents.end(),
                                        [&](Key parent) { return nodes_.at(parent).leadsToDeepest; });
    }
  }

  // A path of `a` can still end in the list: above the depth it must lead to a deepest
  // common ancestor, enter one from above, and below it go down a longest way.
  bool mayGoOn(Key from, Key to) const {
    const Node& above = nodes_.at(from);
    const Node& next = nodes_.at(to);
    if (next.height > depth_) return next.leadsToDeepest;
    if (above.height > depth_) return isDeepest(to);
    return next.height + 1 == above.height;
  }

  Commit a_;
  std::size_t cap_;
  std::unordered_map<Key, Node> nodes_;
  std::vector<Key> byHeight_;
  std::size_t depth_ = 0;
  std::unordered_map<Key, std::size_t> walksFromB_;
};

}  // namespace

std::vector<Commit> lowestCommonAncestors(const Commit& a, const Commit& b) {
  const CommonAncestry ancestry(a, b, kUncounted);
  if (ancestry.unrelated()) return {};
  std::vector<Commit> list = ancestry.entries(kUncounted, history::kEveryWalk);
  if (list.size() == 2 && list[0] == list[1]) list.pop_back();
  return list;
}

namespace {

constexpr std::size_t kThreeOrMore = 3;

// The deepest common ancestors and the length of the list, from what lies above them only:
// commits are taken tallest first from both sides, so the first that both reach is as deep
// as any common ancestor, and every walk from `a` or `b` to one of that depth passes only
// taller commits. nullopt when there are several: which comes first is decided below them.
std::optional<AncestorList> summarizeFromAbove(const Commit& a, const Commit& b) {
  history::CommitDepths& depths = history::CommitDepths::of(*a->getModelImpl());
  struct Reached {
    Commit commit;
    std::size_t height = 0;
    bool fromA = false, fromB = false;
    std::size_t walksFromA = 0, walksFromB = 0;
  };
  std::unordered_map<Key, Reached> reached;
  std::priority_queue<std::pair<std::size_t, Key>> tallestFirst;
  const auto reach = [&](const Commit& commit, bool fromA, bool fromB, std::size_t walksA,
                         std::size_t walksB) {
    const auto [it, isNew] = reached.try_emplace(commit.getImpl());
    Reached& entry = it->second;
    if (isNew) {
      entry.commit = commit;
      entry.height = depths.of(commit).height;
      tallestFirst.emplace(entry.height, commit.getImpl());
    }
    entry.fromA = entry.fromA || fromA;
    entry.fromB = entry.fromB || fromB;
    entry.walksFromA = addUpTo(entry.walksFromA, walksA, kThreeOrMore);
    entry.walksFromB = addUpTo(entry.walksFromB, walksB, kThreeOrMore);
  };
  reach(a, true, false, 1, 0);
  reach(b, false, true, 0, 1);
  std::size_t depth = 0;
  std::vector<Key> deepest;
  while (!tallestFirst.empty()) {
    const auto [height, key] = tallestFirst.top();
    if (height < depth) break;
    tallestFirst.pop();
    const Reached& at = reached.at(key);
    if (at.fromA && at.fromB) {
      depth = height;
      deepest.push_back(key);
      continue;
    }
    if (!at.commit || at.commit->isInitial() || height == depth) continue;
    const Reached from = at;  // `reached` grows below
    for (const Commit& parent : history::parentsOf(from.commit)) {
      reach(parent, from.fromA, from.fromB, from.walksFromA, from.walksFromB);
    }
  }
  AncestorList summary;
  if (deepest.empty()) return summary;
  if (deepest.size() > 1) return std::nullopt;
  const Reached& ancestor = reached.at(deepest.front());
  const std::size_t ways = depths.of(ancestor.commit).longestWays;
  summary.length =
      multiplyUpTo(multiplyUpTo(ancestor.walksFromA, ways, kThreeOrMore), ancestor.walksFromB, kThreeOrMore);
  summary.first = ancestor.commit;
  if (summary.length > 1) summary.second = ancestor.commit;
  return summary;
}

}  // namespace

AncestorList summarizeLowestCommonAncestors(const Commit& a, const Commit& b) {
  if (const std::optional<AncestorList> fromAbove = summarizeFromAbove(a, b)) return *fromAbove;
  const CommonAncestry ancestry(a, b, kThreeOrMore);
  AncestorList summary;
  if (ancestry.unrelated()) return summary;
  summary.length = ancestry.listLength();
  const std::vector<Commit> firstTwo = ancestry.entries(std::min<std::size_t>(summary.length, 2), 2);
  if (!firstTwo.empty()) summary.first = firstTwo[0];
  if (firstTwo.size() > 1) summary.second = firstTwo[1];
  return summary;
}

}  // namespace kiv::merge
