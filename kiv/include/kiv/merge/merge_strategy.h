// IMergeStrategy: how two tip commits become one merged commit.
//
//   class Mine : public kiv::IMergeStrategy {
//     kiv::Commit run(const kiv::Commit& ours, const kiv::Commit& theirs) const override;
//   };
//   ours->merge(theirs, Mine());   // kiv::Branch::Impl::merge
//
// A branch merges through a strategy without knowing which: the strategy returns a new
// commit carrying the merged delta, and the branch gives it its parents [ours, theirs].
#pragma once

#include "kiv/metamodel/commit.h"

namespace kiv {

// What a branch merges through: run() makes a new commit without parents whose delta takes
// ours to the merged state; the branch gives it its parents and makes it the tip.
class IMergeStrategy {
 public:
  virtual ~IMergeStrategy() = default;

  // A new commit, without parents, whose delta turns the state at `ours` into the merged
  // state. REQUIRES: both commits live, in one model. Strategies hold no state between
  // runs beyond what they own, and run on the caller's thread.
  virtual Commit run(const Commit& ours, const Commit& theirs) const = 0;
};

}  // namespace kiv
