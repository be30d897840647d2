// What the three-way strategies share: the comparison against a chosen base and the tool
// run that follows it.
#pragma once

#include "kiv/merge/merge_tool.h"

namespace kiv::merge {

// A new commit in the model of `ours`, without parents, whose delta is what `tool` makes
// of the three-way comparison of `base`, `ours` and `theirs`. REQUIRES: an open
// transaction on that model is the caller's to commit.
Commit mergeAgainst(const Commit& base, const Commit& ours, const Commit& theirs, const IMergeTool& tool);

}  // namespace kiv::merge
