// Whether snapshots may start from states kept for recent commits.
//
// Commit::getSnapshot, Commit::diff across a whole state, and the three states a merge
// compares each compose a first-parent line of deltas. The history model keeps the composed
// states of a few recent commits (and of commits a fixed distance behind them), so that a
// snapshot costs the commits since a kept state rather than the whole line. The results are
// exactly those of composing every delta; any change to a commit or delta on a kept line
// drops the kept states. Turning keeping off (on by default) is for comparing the two.
#pragma once

#include "qf/zero/core/model.h"

namespace kiv {

// REQUIRES: `historyModel` is a live model (the one holding the commits).
void keepSnapshotStates(const qf::zero::Model& historyModel, bool keep);

}  // namespace kiv
