// The walks over the commit graph: paths, ancestry, selection by depth and range.
#include "history/ancestry.h"
#include "history/history_support.h"
#include "kiv/metamodel/commit_impl.h"

#include <climits>
#include <deque>
#include <unordered_set>

namespace kiv {

namespace {

using Path = std::vector<Commit>;

std::vector<Commit> parentsOf(const Commit& commit) {
  const auto& parents = commit.getParents();
  std::vector<Commit> resolved;
  resolved.reserve(parents.size());
  for (const qf::zero::ModelElement& parent : parents.getAllValuesAndProxies()) {
    resolved.push_back(qf::zero::elementCast<Commit>(parents.resolveProxy(parent)));
  }
  return resolved;
}

}  // namespace

namespace history {

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

// A target that is no ancestor is told apart first: the walk itself would only give up
// after every path had ended, which is exponential in the merges on the way.
Path Commit::Impl::findPath(const Commit& target) const {
  if (!target || !history::reaches(Commit(const_cast<Impl*>(this)), *target.getImpl())) return {};
  std::vector<Path> found = findPathHelper([&](const Commit& commit) { return commit == target; });
  if (found.size() == 1 && found.front().back() == target) return std::move(found.front());
  return {};
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
  if (limit == 0) return;
  for (const Commit& commit : commits) {
    if (!commit) continue;
    for (const Path& path : commit->findAllPaths()) {
      const std::size_t count = std::min(limit, path.size());
      result.insert(path.begin(), path.begin() + static_cast<std::ptrdiff_t>(count));
    }
  }
}

// The commits reachable from `commits` but not from `predecessors`, both sides including
// the start commits themselves.
void Commit::Impl::selectInRange(const std::unordered_set<Commit>& predecessors,
                                 const std::unordered_set<Commit>& commits,
                                 std::unordered_set<Commit>& result) {
  std::unordered_set<Commit> excluded;
  select(predecessors, excluded, -1);
  select(commits, result, -1);
  for (const Commit& commit : excluded) result.erase(commit);
}

}  // namespace kiv
