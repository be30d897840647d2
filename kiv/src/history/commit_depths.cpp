#include "history/commit_depths.h"

#include "history/path_order_walk.h"
#include "kiv/metamodel/commit_impl.h"
#include "qf/zero/core/model_impl.h"

#include <algorithm>
#include <memory>
#include <utility>
#include <vector>

namespace kiv::history {

namespace {

const int kAttachmentKey = 0;

}  // namespace

CommitDepths& CommitDepths::of(qf::zero::ModelImpl& model) {
  std::shared_ptr<void>& slot = model.attachment(&kAttachmentKey);
  if (!slot) slot = std::make_shared<CommitDepths>();
  return *static_cast<CommitDepths*>(slot.get());
}

CommitDepths::Depth CommitDepths::of(const Commit& commit) {
  if (!commit) return {1, 1};
  qf::zero::ModelImpl& model = *commit->getModelImpl();
  if (seenChanges_ != model.getWatchedChangeCount()) {
    depths_.clear();
  }
  if (const auto found = depths_.find(commit.getImpl()); found != depths_.end()) return found->second.depth;

  // Parents before children, each commit not yet measured once.
  std::vector<std::pair<Commit, bool>> pending{{commit, false}};
  while (!pending.empty()) {
    auto [at, parentsDone] = pending.back();
    pending.pop_back();
    if (depths_.count(at.getImpl()) != 0) continue;
    const std::vector<Commit> parents = parentsOf(at);
    if (!parentsDone) {
      pending.emplace_back(at, true);
      for (const Commit& parent : parents) {
        if (parent && depths_.count(parent.getImpl()) == 0) pending.emplace_back(parent, false);
      }
      continue;
    }
    Depth depth{1, 1};
    if (!parents.empty()) {
      std::size_t tallest = 0;
      for (const Commit& parent : parents)
        tallest = std::max(tallest, parent ? depths_.at(parent.getImpl()).depth.height : 1);
      depth.height = tallest + 1;
      depth.longestWays = 0;
      for (const Commit& parent : parents) {
        const Depth behind = parent ? depths_.at(parent.getImpl()).depth : Depth{1, 1};
        if (behind.height == tallest)
          depth.longestWays = std::min(kManyWays, depth.longestWays + behind.longestWays);
      }
    }
    at->setWatched(true);
    depths_.emplace(at.getImpl(), Measured{depth, at});
  }
  seenChanges_ = model.getWatchedChangeCount();
  return depths_.at(commit.getImpl()).depth;
}

}  // namespace kiv::history
