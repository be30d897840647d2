// The commit-graph walks written as path enumerations, step for step as they are defined:
// the oracle that the library's walks must agree with. Each takes time in proportion to
// the number of paths, which doubles with every merge whose sides have several paths, so
// only small graphs can be asked.
#pragma once

#include "kiv/merge/merge3_strategy.h"
#include "kiv/metamodel/commit_impl.h"

#include <algorithm>
#include <climits>
#include <cstddef>
#include <unordered_set>
#include <vector>

namespace kiv::literal {

using Path = std::vector<Commit>;

// findPathHelper with a predicate of identity; one path ending at `target`, or none.
inline Path findPath(const Commit& from, const Commit& target) {
  std::vector<Path> found = from->findPathHelper([&](const Commit& commit) { return commit == target; });
  if (found.size() == 1 && !found.front().empty() && found.front().back() == target) return found.front();
  return {};
}

// The first min(limit, length) commits of every path of every commit.
inline void select(const std::unordered_set<Commit>& commits, std::unordered_set<Commit>& result, int depth) {
  const std::size_t limit = depth < 0 ? static_cast<std::size_t>(INT_MAX) : static_cast<std::size_t>(depth);
  for (const Commit& commit : commits) {
    if (!commit) continue;
    for (const Path& path : commit->findAllPaths()) {
      result.insert(path.begin(), path.begin() + static_cast<std::ptrdiff_t>(std::min(limit, path.size())));
    }
  }
}

inline void selectInRange(const std::unordered_set<Commit>& predecessors,
                          const std::unordered_set<Commit>& commits, std::unordered_set<Commit>& result) {
  std::unordered_set<Commit> excluded;
  select(predecessors, excluded, -1);
  select(commits, result, -1);
  for (const Commit& commit : excluded) result.erase(commit);
}

// Every path of `a` against every path of `b`, both read from the root; the last commits
// of the longest common prefixes, exactly two equal ones folded.
inline std::vector<Commit> findLCA(const Commit& a, const Commit& b) {
  std::vector<Commit> candidates;
  std::size_t candidateLength = 0;
  for (Path pathOfA : a->findAllPaths()) {
    std::reverse(pathOfA.begin(), pathOfA.end());
    for (Path pathOfB : b->findAllPaths()) {
      std::reverse(pathOfB.begin(), pathOfB.end());
      const Path common = Merge3Strategy::intersectPaths(pathOfA, pathOfB);
      if (common.empty() || common.size() < candidateLength) continue;
      if (common.size() > candidateLength) candidates.clear();
      candidateLength = common.size();
      candidates.push_back(common.back());
    }
  }
  if (candidates.size() == 2 && candidates[0] == candidates[1]) candidates.pop_back();
  return candidates;
}

}  // namespace kiv::literal
