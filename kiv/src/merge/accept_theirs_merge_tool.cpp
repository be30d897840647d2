#include "kiv/merge/accept_theirs_merge_tool.h"

#include "history/history_support.h"
#include "kiv/metamodel/delta_impl.h"
#include "kiv/metamodel/object_storage_impl.h"

namespace kiv {

namespace {

// Puts `storage` under its element's UUID, replacing what the map held there.
void putReplacing(history::StorageMap& map, const qf::zero::Uuid& uuid, const ObjectStorage& storage) {
  if (const auto it = map.container().find(uuid); it != map.container().end()) {
    if (it->second == storage) return;
    map.remove(ObjectStorage(it->second));
  }
  map.add(storage);
}

}  // namespace

Delta AcceptTheirsMergeTool::run(const Commit&, const Commit&, const Commit&,
                                 const std::vector<Delta>& deltas) const {
  if (deltas.size() < 3 || !history::isLive(deltas[0]) || !history::isLive(deltas[2])) {
    qf::zero::reportException(qf0::messages::ElementRequired(u"kiv.AcceptTheirsMergeTool.run"));
  }
  Delta::Impl& merged = *deltas[0].getImpl();
  const Delta::Impl& theirs = *deltas[2].getImpl();
  qf::zero::Transaction transaction = history::beginTransactionOn(merged);
  history::forEachPresent(theirs.getCurrent(), [&](const qf::zero::Uuid& uuid, const ObjectStorage& storage) {
    putReplacing(merged.getCurrentMutable(), uuid, storage);
  });
  history::forEachPresent(theirs.getPrevious(),
                          [&](const qf::zero::Uuid& uuid, const ObjectStorage& storage) {
                            putReplacing(merged.getPreviousMutable(), uuid, storage);
                          });
  transaction.commit();
  return deltas[0];
}

}  // namespace kiv
