#include "kiv/merge/recursive_merge3_strategy.h"

#include "history/history_support.h"
#include "kiv/merge/merge3_strategy.h"
#include "kiv/metamodel/commit_impl.h"
#include "kiv/metamodel/delta_impl.h"
#include "merge/merge_support.h"

namespace kiv {

RecursiveMerge3Strategy::RecursiveMerge3Strategy(std::unique_ptr<IMergeTool> tool) : tool_(std::move(tool)) {
  if (!tool_) qf::zero::reportException(qf0::messages::ElementRequired(u"kiv.RecursiveMerge3Strategy.tool"));
}

RecursiveMerge3Strategy::~RecursiveMerge3Strategy() = default;

// With several ancestors the first two are merged into the base; when those two are one
// commit (a commit with several equally long paths is its own ancestor several times),
// merging it with itself would ask the same question again, so it is the base itself.
Commit RecursiveMerge3Strategy::run(const Commit& ours, const Commit& theirs) const {
  const std::vector<Commit> ancestors = Merge3Strategy::findLCA(ours, theirs);
  qf::zero::Transaction transaction = history::beginTransactionOn(*ours.getImpl());
  Commit base;
  Delta emptyState;
  if (ancestors.size() == 1 || (ancestors.size() > 1 && ancestors[0] == ancestors[1])) {
    base = ancestors.front();
  } else if (ancestors.size() > 1) {
    base = run(ancestors[0], ancestors[1]);
  } else {
    base = Commit::create(ours.getModel());
    emptyState = Delta::create(ours.getModel());
    base->setDelta(emptyState);
  }
  const Commit result = merge::mergeAgainst(base, ours, theirs, *tool_);
  if (emptyState) {
    emptyState.destroy();
    base.destroy();
  }
  transaction.commit();
  return result;
}

}  // namespace kiv
