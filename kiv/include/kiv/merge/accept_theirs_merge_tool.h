// AcceptTheirsMergeTool: settles each element that a three-way comparison left open by
// taking theirs whole.
//
// An edit of ours to another property of the same element is lost; PropertyMergeTool
// keeps such edits.
#pragma once

#include "kiv/merge/merge_tool.h"

namespace kiv {

// Settles every element both sides changed by taking theirs' entry whole. It records no
// conflicts and holds no state.
class AcceptTheirsMergeTool : public IMergeTool {
 public:
  // Copies the entries of the third delta into the first, current and previous maps in
  // UUID order, and returns the first. An entry the first already holds for the same
  // element is replaced by theirs. REQUIRES: three live deltas ("ElementRequired").
  Delta run(const Commit& ancestor, const Commit& ours, const Commit& theirs,
            const std::vector<Delta>& deltas) const override;
};

}  // namespace kiv
