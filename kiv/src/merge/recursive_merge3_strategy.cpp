#include "kiv/merge/recursive_merge3_strategy.h"

#include "history/history_support.h"
#include "kiv/merge/lowest_common_ancestors.h"
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
  history::requireLive(ours, u"kiv.Merge3Strategy.findLCA");
  history::requireLive(theirs, u"kiv.Merge3Strategy.findLCA");
  const merge::AncestorList ancestors = merge::summarizeLowestCommonAncestors(ours, theirs);
  qf::zero::Transaction transaction = history::beginTransactionOn(*ours.getImpl());
  Commit base;
  Delta emptyState;
  if (ancestors.length == 1 || (ancestors.length > 1 && ancestors.first == ancestors.second)) {
    base = ancestors.first;
  } else if (ancestors.length > 1) {
    base = run(ancestors.first, ancestors.second);
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
