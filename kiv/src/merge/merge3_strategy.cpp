#include "kiv/merge/merge3_strategy.h"

#include "history/history_support.h"
#include "kiv/merge/lowest_common_ancestors.h"
#include "kiv/messages/messages.h"
#include "kiv/metamodel/commit_impl.h"
#include "kiv/metamodel/delta_impl.h"
#include "merge/merge_support.h"

namespace kiv {

namespace merge {

Commit mergeAgainst(const Commit& base, const Commit& ours, const Commit& theirs, const IMergeTool& tool) {
  const Commit result = Commit::create(ours.getModel());
  const std::vector<Delta> deltas = Merge3Strategy::diff3(base, ours, theirs);
  const Delta merged = tool.run(base, ours, theirs, deltas);
  history::requireLive(merged, u"kiv.IMergeTool.run");
  result->setDelta(merged);
  return result;
}

}  // namespace merge

Merge3Strategy::Merge3Strategy(std::unique_ptr<IMergeTool> tool) : tool_(std::move(tool)) {
  if (!tool_) qf::zero::reportException(qf0::messages::ElementRequired(u"kiv.Merge3Strategy.tool"));
}

Merge3Strategy::~Merge3Strategy() = default;

Merge3Strategy::Path Merge3Strategy::intersectPaths(const Path& p, const Path& q) {
  Path common;
  for (std::size_t i = 0; i < p.size() && i < q.size() && p[i] == q[i]; ++i) common.push_back(p[i]);
  return common;
}

std::vector<Commit> Merge3Strategy::findLCA(const Commit& a, const Commit& b) {
  history::requireLive(a, u"kiv.Merge3Strategy.findLCA");
  history::requireLive(b, u"kiv.Merge3Strategy.findLCA");
  return merge::lowestCommonAncestors(a, b);
}

Commit Merge3Strategy::run(const Commit& ours, const Commit& theirs) const {
  history::requireLive(ours, u"kiv.Merge3Strategy.findLCA");
  history::requireLive(theirs, u"kiv.Merge3Strategy.findLCA");
  const merge::AncestorList ancestors = merge::summarizeLowestCommonAncestors(ours, theirs);
  if (!ancestors.isUnique()) qf::zero::reportException(messages::NoUniqueLCA());
  qf::zero::Transaction transaction = history::beginTransactionOn(*ours.getImpl());
  const Commit result = merge::mergeAgainst(ancestors.first, ours, theirs, *tool_);
  transaction.commit();
  return result;
}

}  // namespace kiv
