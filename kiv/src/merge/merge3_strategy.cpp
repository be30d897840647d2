#include "kiv/merge/merge3_strategy.h"

#include "history/history_support.h"
#include "kiv/messages/messages.h"
#include "kiv/metamodel/commit_impl.h"
#include "kiv/metamodel/delta_impl.h"
#include "merge/merge_support.h"

#include <algorithm>

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

// The paths of `b` are the same for every path of `a`, so they are taken once.
std::vector<Commit> Merge3Strategy::findLCA(const Commit& a, const Commit& b) {
  history::requireLive(a, u"kiv.Merge3Strategy.findLCA");
  history::requireLive(b, u"kiv.Merge3Strategy.findLCA");
  const auto rootFirst = [](std::vector<Path> paths) {
    for (Path& path : paths) std::reverse(path.begin(), path.end());
    return paths;
  };
  const std::vector<Path> pathsOfA = rootFirst(a->findAllPaths());
  const std::vector<Path> pathsOfB = rootFirst(b->findAllPaths());
  std::vector<Commit> candidates;
  std::size_t candidateLength = 0;
  for (const Path& pathOfA : pathsOfA) {
    for (const Path& pathOfB : pathsOfB) {
      const Path common = intersectPaths(pathOfA, pathOfB);
      if (common.empty() || common.size() < candidateLength) continue;
      if (common.size() > candidateLength) candidates.clear();
      candidateLength = common.size();
      candidates.push_back(common.back());
    }
  }
  if (candidates.size() == 2 && candidates[0] == candidates[1]) candidates.pop_back();
  return candidates;
}

Commit Merge3Strategy::run(const Commit& ours, const Commit& theirs) const {
  const std::vector<Commit> ancestors = findLCA(ours, theirs);
  if (ancestors.size() != 1) qf::zero::reportException(messages::NoUniqueLCA());
  qf::zero::Transaction transaction = history::beginTransactionOn(*ours.getImpl());
  const Commit result = merge::mergeAgainst(ancestors.front(), ours, theirs, *tool_);
  transaction.commit();
  return result;
}

}  // namespace kiv
