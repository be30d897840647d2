// The lowest common ancestors of two commits, found without taking every pair of paths.
//
// The list that Merge3Strategy::findLCA defines holds, for every path of `a` (in
// findAllPaths order) and every path of `b`, the last commit of their longest common prefix
// read from the root, keeping only the longest such prefixes. A prefix that long ends in a
// common ancestor c whose longest way back to a root is as long as any common ancestor's
// (call that length the depth); the path of `a` goes from `a` to c and on along one of c's
// longest ways back, and it meets every path of `b` that goes to c and on the same way. So
// the list is: for each path of `a` that runs into such a c and then down one of its
// longest ways, c as many times as there are walks from `b` to c. Those paths are taken in
// findAllPaths order by a walk that drops every other path as soon as it cannot become one.
#pragma once

#include "kiv/metamodel/commit.h"

#include <cstddef>
#include <vector>

namespace kiv::merge {

// findLCA's list, exactly. REQUIRES: live commits. The cost is linear in the history
// behind `a` and `b` plus, per entry of the list, the history behind `a`.
std::vector<Commit> lowestCommonAncestors(const Commit& a, const Commit& b);

// What the three-way strategies read of that list, however long it is: its length up to 3
// (3 meaning "three or more"; two equal entries count as two here) and its first two
// entries. REQUIRES: live commits. With one deepest common ancestor (every history that
// merges without criss-crosses) the cost is that of the commits above it, the depths of
// commits being kept beside the history model; with several, or none, it is linear in the
// history behind `a` and `b`.
struct AncestorList {
  std::size_t length = 0;
  Commit first, second;

  // One ancestor after the fold: a single entry, or exactly two that are one commit.
  bool isUnique() const { return length == 1 || (length == 2 && first == second); }
};
AncestorList summarizeLowestCommonAncestors(const Commit& a, const Commit& b);

}  // namespace kiv::merge
