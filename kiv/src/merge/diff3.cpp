// Merge3Strategy::diff3: the element-by-element comparison of three snapshots.
#include "history/history_support.h"
#include "kiv/merge/merge3_strategy.h"
#include "kiv/metamodel/commit_impl.h"
#include "kiv/metamodel/delta_impl.h"

namespace kiv {

namespace {

using history::presentEntry;
using history::StorageMap;
using qf::zero::Uuid;

// The three result deltas, filled through their maps inside the comparison's one
// transaction: the same entries as the delta operations would add, without a savepoint
// per entry.
class Diff3Result {
 public:
  explicit Diff3Result(const qf::zero::Model& model)
      : merged_(Delta::create(model)), ours_(Delta::create(model)), theirs_(Delta::create(model)) {
    merged_->setIsSnapshot(true);
  }

  void created(const ObjectStorage& current) { merged_->getCurrentMutable().add(current); }
  void updated(const ObjectStorage& previous, const ObjectStorage& current) {
    merged_->getPreviousMutable().add(previous);
    merged_->getCurrentMutable().add(current);
  }
  void deleted(const ObjectStorage& previous) { merged_->getPreviousMutable().add(previous); }

  // A conflict: each side's version goes to its own delta; an empty handle stands for
  // "deleted" (with a base) or "absent" (without one).
  void conflict(const ObjectStorage& base, const ObjectStorage& ours, const ObjectStorage& theirs) {
    record(*ours_.getImpl(), base, ours);
    record(*theirs_.getImpl(), base, theirs);
  }

  std::vector<Delta> deltas() const { return {merged_, ours_, theirs_}; }

 private:
  static void record(Delta::Impl& side, const ObjectStorage& base, const ObjectStorage& version) {
    if (base) side.getPreviousMutable().add(base);
    if (version) side.getCurrentMutable().add(version);
  }

  Delta merged_, ours_, theirs_;
};

// Step one: every element of the base, by what each side did to it.
void compareBaseElements(const Delta::Impl& base, const StorageMap& ours, const StorageMap& theirs,
                         Diff3Result& result) {
  history::forEachPresent(base.getCurrent(), [&](const Uuid& uuid, const ObjectStorage& b) {
    const ObjectStorage o = presentEntry(ours, uuid);
    const ObjectStorage t = presentEntry(theirs, uuid);
    if (!o) {
      if (!t || t == b) {
        result.deleted(b);
      } else {
        result.conflict(b, {}, t);
      }
    } else if (o == b) {
      if (!t) {
        result.deleted(b);
      } else if (const ObjectStorage p = presentEntry(base.getPrevious(), uuid)) {
        // Ours left it alone: theirs is taken unseen, against the base's previous entry.
        result.updated(p, t);
      } else {
        result.created(t);
      }
    } else if (t && (t == b || t == o)) {
      result.updated(b, o);
    } else {
      result.conflict(b, o, t);
    }
  });
}

// Step two: elements new on our side; step three: elements new on theirs only.
void compareNewElements(const Delta::Impl& base, const StorageMap& ours, const StorageMap& theirs,
                        Diff3Result& result) {
  history::forEachPresent(ours, [&](const Uuid& uuid, const ObjectStorage& o) {
    if (presentEntry(base.getCurrent(), uuid)) return;
    const ObjectStorage t = presentEntry(theirs, uuid);
    if (!t || t == o) {
      result.created(o);
    } else {
      result.conflict({}, o, t);
    }
  });
  history::forEachPresent(theirs, [&](const Uuid& uuid, const ObjectStorage& t) {
    if (presentEntry(base.getCurrent(), uuid) || presentEntry(base.getPrevious(), uuid)) return;
    if (!presentEntry(ours, uuid)) result.created(t);
  });
}

}  // namespace

std::vector<Delta> Merge3Strategy::diff3(const Commit& base, const Commit& ours, const Commit& theirs) {
  history::requireLive(base, u"kiv.Merge3Strategy.diff3");
  history::requireLive(ours, u"kiv.Merge3Strategy.diff3");
  history::requireLive(theirs, u"kiv.Merge3Strategy.diff3");
  qf::zero::Transaction transaction = history::beginTransactionOn(*ours.getImpl());
  Diff3Result result(ours.getModel());
  Delta baseState = base->getSnapshot();
  Delta oursState = ours->getSnapshot();
  Delta theirsState = theirs->getSnapshot();
  compareBaseElements(*baseState.getImpl(), oursState.getCurrent(), theirsState.getCurrent(), result);
  compareNewElements(*baseState.getImpl(), oursState.getCurrent(), theirsState.getCurrent(), result);
  // The snapshots share the recorded storages and own nothing.
  baseState.destroy();
  oursState.destroy();
  theirsState.destroy();
  transaction.commit();
  return result.deltas();
}

}  // namespace kiv
