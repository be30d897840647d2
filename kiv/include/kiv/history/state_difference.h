// stateDifference: the change between the states at two commits, read as states.
//
//   Delta back = kiv::stateDifference(snapshotCommit, snapshotCommit->getParent());
//   producer.update(back);   // the user model now shows the parent's state
//   back.destroy();
//
// Commit::diff composes the recorded deltas on the path between two commits. A delta
// that holds a whole state (a snapshot, or the result of a merge) then reads as a
// change from nothing, and its inverse as the deletion of every element it holds. This
// function compares the two states instead, so it is right whatever lies between.
#pragma once

#include "kiv/metamodel/commit.h"
#include "kiv/metamodel/delta.h"

#include <vector>

namespace kiv {

// A new delta in the model of the live one of `from` and `to` that takes a model from the
// state at `from` to the state at `to`. An empty or destroyed commit stands for the empty
// state. An element whose content is byte-identical in both states is left out, even
// when two storages record it; the others are created, updated (previous from `from`,
// current from `to`) or deleted. Storages are shared with the commits, not copied.
// Costs in proportion to the sizes of both states and the deltas composed to read them.
// REQUIRES: at least one of the two is a live commit ("ElementRequired" otherwise).
// Runs in one transaction on that commit's model; the caller destroys the result.
Delta stateDifference(const Commit& from, const Commit& to);

// True when a commit of `path` (as Commit::findPath returns it, the newer end first) other
// than the last holds a whole state, so that Commit::diff along it would read that state
// as a change from nothing. The last commit's own delta is part of the older end's state.
bool crossesWholeState(const std::vector<Commit>& path);

}  // namespace kiv
