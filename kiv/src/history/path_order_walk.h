// The walks of findPathHelper, in its order, without copying paths and without taking
// every path.
//
// findPathHelper takes paths from a commit toward its initial commits one at a time: the
// front path goes along first parents; at a merge, the paths through the other parents
// wait at the back of the queue, in parent order. A path is thus ranked by how many times
// it left a first-parent line, then by where it left and by which parent, earliest first.
// Two facts let a walk in that order stop early without changing what it finds first:
//  - the walks that enter a commit do so in rank order, and whatever way leads on from
//    the commit continues each of them, keeping their order; so when only the first k
//    walks that end somewhere matter, a commit needs to be entered at most k times;
//  - a walk that can no longer end where the caller looks may be dropped with every path
//    that would branch off it later, provided whether a walk "can still end well" depends
//    only on the commit it has reached.
// Each step is kept once, linked to the step before it on its walk, so a walk that waits
// at the back of the queue costs one step, not a copy of its path.
#pragma once

#include "kiv/metamodel/commit_impl.h"

#include <cstddef>
#include <deque>
#include <limits>
#include <unordered_map>
#include <vector>

namespace kiv::history {

// The parents of `commit` in order, proxies resolved; null where a parent is not resident.
std::vector<Commit> parentsOf(const Commit& commit);

struct WalkStep {
  Commit commit;         // null: a parent that is not resident, which ends its walk
  std::size_t previous;  // kFirstStep on a walk's start
};

inline constexpr std::size_t kFirstStep = std::numeric_limits<std::size_t>::max();
inline constexpr std::size_t kEveryWalk = std::numeric_limits<std::size_t>::max();

// The commits of the walk that ends at `last`, from its start.
std::vector<Commit> walkTo(const std::vector<WalkStep>& steps, std::size_t last);

// Walks from `start` in findPathHelper's order, filling `steps`.
//  - `mayStep(from, parent)`: false drops the walk that would go on from `from` to `parent`
//    (the walk's side lines that branch off earlier stay);
//  - `walksPerCommit`: a commit is entered by at most this many walks, later ones are
//    dropped (kEveryWalk: no limit; a null parent is never counted);
//  - `arrive(step)`: called as a walk enters a commit, before it goes on; true stops all;
//  - `finish(step)`: called when a walk ends at an initial commit or at a parent that is not
//    resident; true stops all.
template <class MayStep, class Arrive, class Finish>
void walkInPathOrder(std::vector<WalkStep>& steps, const Commit& start, std::size_t walksPerCommit,
                     const MayStep& mayStep, const Arrive& arrive, const Finish& finish) {
  std::unordered_map<const Commit::Impl*, std::size_t> entered;
  const auto enter = [&](const Commit& commit) {
    if (walksPerCommit == kEveryWalk || !commit) return true;
    std::size_t& count = entered[commit.getImpl()];
    if (count == walksPerCommit) return false;
    ++count;
    return true;
  };
  std::deque<std::size_t> waiting;
  steps.push_back({start, kFirstStep});
  waiting.push_back(steps.size() - 1);
  while (!waiting.empty()) {
    std::size_t at = waiting.front();
    waiting.pop_front();
    if (!enter(steps[at].commit)) continue;
    while (true) {
      if (arrive(at)) return;
      const Commit commit = steps[at].commit;  // a copy: `steps` grows below
      if (!commit || commit->isInitial()) {
        if (finish(at)) return;
        break;
      }
      const std::vector<Commit> parents = parentsOf(commit);
      for (std::size_t index = 1; index < parents.size(); ++index) {
        if (!mayStep(commit, parents[index])) continue;
        steps.push_back({parents[index], at});
        waiting.push_back(steps.size() - 1);
      }
      if (!mayStep(commit, parents.front())) break;
      steps.push_back({parents.front(), at});
      at = steps.size() - 1;
      if (!enter(steps[at].commit)) break;
    }
  }
}

}  // namespace kiv::history
