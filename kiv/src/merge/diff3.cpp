// Merge3Strategy::diff3: the element-by-element comparison of three snapshots.
#include "history/composed_state.h"
#include "history/history_support.h"
#include "kiv/merge/merge3_strategy.h"
#include "kiv/metamodel/commit_impl.h"
#include "kiv/metamodel/delta_impl.h"

#include <algorithm>
#include <utility>
#include <vector>

namespace kiv {

namespace {

using history::ComposedState;
using qf::zero::Uuid;

// The three result deltas, filled through their maps inside the comparison's one
// transaction: the same entries as the delta operations would add, without a savepoint
// per entry. The merged delta's entries, which name every element of the base, are
// gathered in the order they are settled and added at the end in one step per map.
class Diff3Result {
 public:
  explicit Diff3Result(const qf::zero::Model& model, std::size_t expected)
      : merged_(Delta::create(model)), ours_(Delta::create(model)), theirs_(Delta::create(model)) {
    merged_->setIsSnapshot(true);
    mergedCurrent_.reserve(expected);
  }

  void created(const ObjectStorage& current) { mergedCurrent_.push_back(current); }
  void updated(const ObjectStorage& previous, const ObjectStorage& current) {
    mergedPrevious_.push_back(previous);
    mergedCurrent_.push_back(current);
  }
  void deleted(const ObjectStorage& previous) { mergedPrevious_.push_back(previous); }

  // A conflict: each side's version goes to its own delta; an empty handle stands for
  // "deleted" (with a base) or "absent" (without one).
  void conflict(const ObjectStorage& base, const ObjectStorage& ours, const ObjectStorage& theirs) {
    record(*ours_.getImpl(), base, ours);
    record(*theirs_.getImpl(), base, theirs);
  }

  std::vector<Delta> finish() {
    merged_->getPreviousMutable().addAll(mergedPrevious_);
    merged_->getCurrentMutable().addAll(mergedCurrent_);
    return {merged_, ours_, theirs_};
  }

 private:
  static void record(Delta::Impl& side, const ObjectStorage& base, const ObjectStorage& version) {
    if (base) side.getPreviousMutable().add(base);
    if (version) side.getCurrentMutable().add(version);
  }

  Delta merged_, ours_, theirs_;
  std::vector<qf::zero::ModelElement> mergedPrevious_, mergedCurrent_;
};

// Step one: every element of the base, by what each side did to it. Each element is
// settled on its own, so the maps are walked in any order.
void compareBaseElements(const ComposedState& base, const ComposedState& ours, const ComposedState& theirs,
                         Diff3Result& result) {
  // In UUID order, the order of the result's maps: each entry then goes last in its map.
  for (const auto& [uuid, entry] : history::inUuidOrder(base.current)) {
    const ObjectStorage& b = *entry;
    const ObjectStorage& o = ours.currentOf(uuid);
    const ObjectStorage& t = theirs.currentOf(uuid);
    if (!o) {
      if (!t || t == b) {
        result.deleted(b);
      } else {
        result.conflict(b, {}, t);
      }
    } else if (o == b) {
      if (!t) {
        result.deleted(b);
      } else if (const ObjectStorage& p = base.previousOf(uuid)) {
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
  }
}

// Step two: elements new on our side; step three: elements new on theirs only.
void compareNewElements(const ComposedState& base, const ComposedState& ours, const ComposedState& theirs,
                        Diff3Result& result) {
  // Few elements are new: they are found in any order and settled in UUID order.
  history::StateEntries newOfOurs(ours.current.seed()), newOfTheirs(ours.current.seed());
  ours.current.forEach([&](const Uuid& uuid, const ObjectStorage& o) {
    if (!base.currentOf(uuid)) newOfOurs.tryInsert(uuid, o);
  });
  theirs.current.forEach([&](const Uuid& uuid, const ObjectStorage& t) {
    if (!base.currentOf(uuid) && !base.previousOf(uuid) && !ours.currentOf(uuid))
      newOfTheirs.tryInsert(uuid, t);
  });
  for (const auto& [uuid, o] : history::inUuidOrder(newOfOurs)) {
    const ObjectStorage& t = theirs.currentOf(uuid);
    if (!t || t == *o) {
      result.created(*o);
    } else {
      result.conflict({}, *o, t);
    }
  }
  for (const auto& [uuid, t] : history::inUuidOrder(newOfTheirs)) result.created(*t);
}

}  // namespace

std::vector<Delta> Merge3Strategy::diff3(const Commit& base, const Commit& ours, const Commit& theirs) {
  history::requireLive(base, u"kiv.Merge3Strategy.diff3");
  history::requireLive(ours, u"kiv.Merge3Strategy.diff3");
  history::requireLive(theirs, u"kiv.Merge3Strategy.diff3");
  qf::zero::Transaction transaction = history::beginTransactionOn(*ours.getImpl());
  const ComposedState baseState = history::snapshotState(base);
  const ComposedState oursState = history::snapshotState(ours);
  const ComposedState theirsState = history::snapshotState(theirs);
  Diff3Result result(ours.getModel(), baseState.current.size());
  compareBaseElements(baseState, oursState, theirsState, result);
  compareNewElements(baseState, oursState, theirsState, result);
  std::vector<Delta> deltas = result.finish();
  transaction.commit();
  return deltas;
}

}  // namespace kiv
