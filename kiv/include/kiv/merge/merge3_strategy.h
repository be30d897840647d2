// Merge3Strategy: the three-way merge of two commits against their one lowest common
// ancestor.
//
//   kiv::Merge3Strategy strategy(std::make_unique<kiv::AcceptTheirsMergeTool>());
//   ours->merge(theirs, strategy);   // "NoUniqueLCA" when the ancestor is not unique
//
// The comparison (`diff3`) settles every element that the two sides did not both change
// in different ways; the strategy's tool settles the rest. Storages agree only by
// identity: two sides that stored equal content separately count as different.
#pragma once

#include "kiv/merge/merge_strategy.h"
#include "kiv/merge/merge_tool.h"

#include <memory>
#include <vector>

namespace kiv {

// Merges against the one lowest common ancestor: the comparison settles what a single side
// changed, the owned tool the rest. Histories without a unique ancestor raise "NoUniqueLCA";
// RecursiveMerge3Strategy merges those.
class Merge3Strategy : public IMergeStrategy {
 public:
  using Path = std::vector<Commit>;

  // REQUIRES: a tool ("ElementRequired" otherwise). The strategy owns it.
  explicit Merge3Strategy(std::unique_ptr<IMergeTool> tool);
  ~Merge3Strategy() override;

  // The longest common prefix of two paths, compared by element identity; empty when
  // either is empty or they start with different commits.
  static Path intersectPaths(const Path& p, const Path& q);

  // The last commits of the longest common prefixes of every path of `a` with every path
  // of `b`, each path read from its root; one entry per longest prefix, so a commit can
  // appear more than once. Exactly two equal entries fold to one, three or more do not.
  // Empty for unrelated histories.
  static std::vector<Commit> findLCA(const Commit& a, const Commit& b);

  // Three new deltas in the model of `ours`: [merged (a snapshot), ours' side, theirs'
  // side], the two sides holding only the elements left to a tool. The snapshots the
  // comparison reads are scratch deltas, gone when it returns.
  static std::vector<Delta> diff3(const Commit& base, const Commit& ours, const Commit& theirs);

  // A new commit, without parents, carrying the tool's delta. Raises "NoUniqueLCA" unless
  // `findLCA` gives exactly one ancestor.
  Commit run(const Commit& ours, const Commit& theirs) const override;

  const IMergeTool& tool() const { return *tool_; }

 private:
  std::unique_ptr<IMergeTool> tool_;
};

}  // namespace kiv
