#include "kiv/merge/accept_theirs_merge_strategy.h"

#include "history/history_support.h"
#include "kiv/metamodel/commit_impl.h"
#include "kiv/metamodel/delta_impl.h"

namespace kiv {

Commit AcceptTheirsMergeStrategy::run(const Commit&, const Commit& theirs) const {
  history::requireLive(theirs, u"kiv.AcceptTheirsMergeStrategy.run");
  qf::zero::Transaction transaction = history::beginTransactionOn(*theirs.getImpl());
  const Commit result = Commit::create(theirs.getModel());
  result->setDelta(theirs->getSnapshot());
  transaction.commit();
  return result;
}

}  // namespace kiv
