#include "kiv/history/state_difference.h"

#include "history/composed_state.h"
#include "history/history_support.h"
#include "kiv/metamodel/commit_impl.h"
#include "kiv/metamodel/delta_impl.h"
#include "kiv/metamodel/object_storage_impl.h"

#include <algorithm>
#include <map>

namespace kiv {

namespace {

// The live storages of a state, in key order so that the result's entries are.
std::map<qf::zero::Uuid, ObjectStorage> liveEntriesAt(const Commit& commit) {
  std::map<qf::zero::Uuid, ObjectStorage> entries;
  if (!history::isLive(commit)) return entries;
  history::snapshotState(commit).current.forEach(
      [&](const qf::zero::Uuid& uuid, const ObjectStorage& storage) {
        if (history::isLive(storage)) entries.emplace(uuid, storage);
      });
  return entries;
}

}  // namespace

Delta stateDifference(const Commit& from, const Commit& to) {
  const Commit owner = history::isLive(to) ? to : from;
  history::requireLive(owner, u"kiv.stateDifference");
  const std::map<qf::zero::Uuid, ObjectStorage> before = liveEntriesAt(from);
  const std::map<qf::zero::Uuid, ObjectStorage> after = liveEntriesAt(to);
  qf::zero::Transaction transaction = history::beginTransactionOn(*owner.getImpl());
  const Delta result = Delta::create(owner.getModel());
  for (const auto& [uuid, current] : after) {
    const auto previous = before.find(uuid);
    if (previous == before.end()) {
      result->addCreated(current);
    } else if (!previous->second->hasSameContent(current)) {
      result->addUpdated(previous->second, current);
    }
  }
  for (const auto& [uuid, previous] : before) {
    if (!after.count(uuid)) result->addDeleted(previous);
  }
  transaction.commit();
  return result;
}

bool crossesWholeState(const std::vector<Commit>& path) {
  if (path.size() < 2) return false;
  return std::any_of(path.begin(), path.end() - 1, [](const Commit& commit) {
    const Delta delta = history::isLive(commit) ? commit->getDelta() : Delta();
    return history::isLive(delta) && delta->getIsSnapshot();
  });
}

}  // namespace kiv
