// RecursiveMerge3Strategy: a three-way merge that also merges histories without one
// lowest common ancestor.
//
// With several ancestors, the first two are merged by this strategy first and the result
// (a commit without parents) is the base; it stays in the model with the comparison's
// unused deltas. Without any, the base is an empty state made for the merge and destroyed
// after it, so every element of both sides counts as created. It never raises
// "NoUniqueLCA".
#pragma once

#include "kiv/merge/merge_strategy.h"
#include "kiv/merge/merge_tool.h"

#include <memory>

namespace kiv {

// A three-way merge of any two histories: several lowest common ancestors are first merged
// into one base, and unrelated histories merge against an empty state.
class RecursiveMerge3Strategy : public IMergeStrategy {
 public:
  // REQUIRES: a tool ("ElementRequired" otherwise). The strategy owns it.
  explicit RecursiveMerge3Strategy(std::unique_ptr<IMergeTool> tool);
  ~RecursiveMerge3Strategy() override;

  Commit run(const Commit& ours, const Commit& theirs) const override;

  const IMergeTool& tool() const { return *tool_; }

 private:
  std::unique_ptr<IMergeTool> tool_;
};

}  // namespace kiv
