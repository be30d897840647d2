// AcceptTheirsMergeStrategy: a merge whose result is theirs, whatever ours holds.
//
// Its commit's delta is the snapshot of theirs; ours is not looked at.
#pragma once

#include "kiv/merge/merge_strategy.h"

namespace kiv {

// Takes theirs' state as the merge result without comparing. It holds no state, so one
// instance serves any number of merges.
class AcceptTheirsMergeStrategy : public IMergeStrategy {
 public:
  // A new commit in the model of `theirs` whose delta is theirs' snapshot.
  Commit run(const Commit& ours, const Commit& theirs) const override;
};

}  // namespace kiv
