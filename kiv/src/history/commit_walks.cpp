// The walks over the commit graph: paths, ancestry, selection by depth and range.
#include "history/ancestry.h"
#include "history/commit_depths.h"
#include "history/history_support.h"
#include "history/path_order_walk.h"
#include "kiv/metamodel/commit_impl.h"

#include <algorithm>
#include <climits>
#include <deque>
#include <functional>
#include <unordered_map>
#include <unordered_set>

namespace kiv {

namespace {

using Path = std::vector<Commit>;
using history::parentsOf;

// Every commit whose distance from one of `starts` along parents is below `limit`, with
// null standing for a parent that is not resident: exactly the commits that the first
// `limit` places of some path of a start hold, since a commit is on such a prefix when its
// nearest start is near enough.
void insertNearerThan(const std::unordered_set<Commit>& starts, std::size_t limit,
                      std::unordered_set<Commit>& result) {
  if (limit == 0) return;
  std::unordered_map<const Commit::Impl*, std::size_t> distance;
  std::deque<Commit> pending;
  for (const Commit& start : starts) {
    if (!start || !distance.emplace(start.getImpl(), 0).second) continue;
    pending.push_back(start);
    result.insert(start);
  }
  while (!pending.empty()) {
    const Commit commit = std::move(pending.front());
    pending.pop_front();
    const std::size_t next = distance.at(commit.getImpl()) + 1;
    if (next >= limit || commit->isInitial()) continue;
    for (Commit& parent : parentsOf(commit)) {
      if (!parent) {
        result.insert(parent);
      } else if (distance.emplace(parent.getImpl(), next).second) {
        result.insert(parent);
        pending.push_back(std::move(parent));
      }
    }
  }
}

}  // namespace

namespace history {

std::vector<Commit> parentsOf(const Commit& commit) {
  const auto& parents = commit->getParents();
  std::vector<Commit> resolved;
  resolved.reserve(parents.size());
  for (const qf::zero::ModelElement& parent : parents.getAllValuesAndProxies()) {
    resolved.push_back(qf::zero::elementCast<Commit>(parents.resolveProxy(parent)));
  }
  return resolved;
}

std::vector<Commit> walkTo(const std::vector<WalkStep>& steps, std::size_t last) {
  std::vector<Commit> walk;
  for (std::size_t at = last; at != kFirstStep; at = steps[at].previous) walk.push_back(steps[at].commit);
  std::reverse(walk.begin(), walk.end());
  return walk;
}

std::function<bool(const Commit&)> mayLeadTo(const Commit& from, const Commit& target) {
  if (!isLive(from) || !isLive(target) || from->getModelImpl() != target->getModelImpl()) {
    return [](const Commit&) { return true; };
  }
  CommitDepths& depths = CommitDepths::of(*target->getModelImpl());
  const std::size_t targetHeight = depths.of(target).height;
  return [&depths, target, targetHeight](const Commit& commit) {
    return !commit || commit == target || depths.of(commit).height > targetHeight;
  };
}

bool reaches(const Commit& from, const Commit::Impl& target) {
  std::vector<Commit> pending{from};
  std::unordered_set<const Commit::Impl*> visited;
  while (!pending.empty()) {
    const Commit commit = std::move(pending.back());
    pending.pop_back();
    if (commit.getImpl() == &target) return true;
    if (!commit || !visited.insert(commit.getImpl()).second) continue;
    for (Commit& parent : parentsOf(commit)) pending.push_back(std::move(parent));
  }
  return false;
}

}  // namespace history

// The front path grows along first parents until it matches or reaches an initial commit;
// the side lines of merges wait at the back in arrival order. No visited set: a commit
// reachable along several lines is in several paths, which is what findAllPaths reports.
std::vector<Path> Commit::Impl::findPathHelper(const std::function<bool(const Commit&)>& pred) const {
  std::deque<Path> queue;
  queue.push_back(Path{Commit(const_cast<Impl*>(this))});
  std::vector<Path> finished;
  while (!queue.empty()) {
    Path& front = queue.front();
    const Commit last = front.back();
    if (pred(last)) return {std::move(front)};
    if (last && !last->isInitial()) {
      const std::vector<Commit> parents = parentsOf(last);
      for (std::size_t index = 1; index < parents.size(); ++index) {
        Path sideLine = front;
        sideLine.push_back(parents[index]);
        queue.push_back(std::move(sideLine));  // a deque keeps `front` valid
      }
      front.push_back(parents.front());
    } else {
      finished.push_back(std::move(front));
      queue.pop_front();
    }
  }
  return finished;
}

// The path findPathHelper would find first, found in its order; a commit is entered by
// the first walk to reach it only, since the first walk to a commit is first to whatever
// lies behind it, and no walk goes below the target's depth. Each commit is entered once,
// so a target that is no ancestor costs at most one walk over the commits taller than it.
Path Commit::Impl::findPath(const Commit& target) const {
  if (!target) return {};
  const Commit self(const_cast<Impl*>(this));
  const auto mayLead = history::mayLeadTo(self, target);
  std::vector<history::WalkStep> steps;
  std::size_t found = history::kFirstStep;
  history::walkInPathOrder(
      steps, self, 1, [&](const Commit&, const Commit& parent) { return mayLead(parent); },
      [&](std::size_t at) {
        if (steps[at].commit != target) return false;
        found = at;
        return true;
      },
      [](std::size_t) { return false; });
  return found == history::kFirstStep ? Path{} : history::walkTo(steps, found);
}

std::vector<Path> Commit::Impl::findAllPaths() const {
  return findPathHelper([](const Commit&) { return false; });
}

// A commit is its own predecessor.
bool Commit::Impl::isPredecessorOf(const Commit& other) const {
  return history::isLive(other) && history::reaches(other, *this);
}

// depth counts commits from the start of each path: 1 selects the commits themselves, a
// negative depth every ancestor, 0 nothing.
void Commit::Impl::select(const std::unordered_set<Commit>& commits, std::unordered_set<Commit>& result,
                          int depth) {
  const std::size_t limit = depth < 0 ? static_cast<std::size_t>(INT_MAX) : static_cast<std::size_t>(depth);
  insertNearerThan(commits, limit, result);
}

// The commits reachable from `commits` but not from `predecessors`, both sides including
// the start commits themselves. What `result` held before loses the excluded commits too.
void Commit::Impl::selectInRange(const std::unordered_set<Commit>& predecessors,
                                 const std::unordered_set<Commit>& commits,
                                 std::unordered_set<Commit>& result) {
  std::unordered_set<Commit> excluded;
  insertNearerThan(predecessors, static_cast<std::size_t>(INT_MAX), excluded);
  insertNearerThan(commits, static_cast<std::size_t>(INT_MAX), result);
  for (const Commit& commit : excluded) result.erase(commit);
}

}  // namespace kiv
