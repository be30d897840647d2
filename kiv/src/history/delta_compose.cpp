// Delta::compose: one delta for a sequence of deltas, most recent first.
#include "history/history_support.h"
#include "kiv/messages/messages.h"
#include "kiv/metamodel/delta_impl.h"

#include <boost/functional/hash.hpp>

#include <algorithm>
#include <unordered_map>

namespace kiv {

namespace {

using history::forEachPresent;
using history::presentEntry;
using qf::zero::Uuid;

// For every element of the sequence: the most recent position at which it is deleted and
// the oldest at which it is created. "No more recent delta deletes it" and "no older delta
// creates it" then cost one lookup instead of a walk over the sequence.
class Lifecycles {
 public:
  explicit Lifecycles(const std::vector<Delta>& deltas) {
    for (std::size_t position = 0; position < deltas.size(); ++position) {
      if (!history::isLive(deltas[position])) continue;
      const Delta::Impl& delta = *deltas[position].getImpl();
      forEachPresent(delta.getPrevious(), [&](const Uuid& uuid, const ObjectStorage&) {
        if (!presentEntry(delta.getCurrent(), uuid)) mostRecentDeletion_.try_emplace(uuid, position);
      });
      forEachPresent(delta.getCurrent(), [&](const Uuid& uuid, const ObjectStorage&) {
        if (!presentEntry(delta.getPrevious(), uuid)) oldestCreation_[uuid] = position;
      });
    }
  }

  bool deletedMoreRecentlyThan(const Uuid& uuid, std::size_t position) const {
    const auto it = mostRecentDeletion_.find(uuid);
    return it != mostRecentDeletion_.end() && it->second < position;
  }
  bool createdEarlierThan(const Uuid& uuid, std::size_t position) const {
    const auto it = oldestCreation_.find(uuid);
    return it != oldestCreation_.end() && it->second > position;
  }

 private:
  std::unordered_map<Uuid, std::size_t, boost::hash<Uuid>> mostRecentDeletion_;
  std::unordered_map<Uuid, std::size_t, boost::hash<Uuid>> oldestCreation_;
};

// A null or destroyed delta counts as an empty one. The result is made in the model of
// the first live delta; a sequence without one has no model to make it in.
const Delta& firstLive(const std::vector<Delta>& deltas) {
  if (deltas.empty()) qf::zero::reportException(messages::CannotComposeZeroDeltas());
  const auto live =
      std::find_if(deltas.begin(), deltas.end(), [](const Delta& d) { return history::isLive(d); });
  if (live == deltas.end()) qf::zero::reportException(qf0::messages::ElementRequired(u"kiv.Delta.compose"));
  return *live;
}

}  // namespace

// Positions run from 0 (the latest change) to n-1 (the oldest). For each i, the currents
// of delta i are taken newest first (a), then the previouses of delta n-1-i oldest first
// (b). The identity test in (b) sees the result's currents as (a) has left them so far,
// so the outcome depends on this interleaving: an element whose oldest "before" is the
// very storage that is its newest "after" ends as it began and drops out.
Delta Delta::Impl::compose(const std::vector<Delta>& deltas) {
  const Delta& first = firstLive(deltas);
  const Lifecycles lifecycles(deltas);
  const std::size_t n = deltas.size();

  qf::zero::Transaction transaction = history::beginTransactionOn(*first.getImpl());
  const Delta result = Delta::create(first.getModel());
  Impl& composed = *result.getImpl();
  CurrentCollection& current = composed.getCurrentMutable();
  PreviousCollection& previous = composed.getPreviousMutable();
  for (std::size_t i = 0; i < n; ++i) {
    if (history::isLive(deltas[i])) {
      forEachPresent(deltas[i]->current_, [&](const Uuid& uuid, const ObjectStorage& storage) {
        if (!presentEntry(current, uuid) && !lifecycles.deletedMoreRecentlyThan(uuid, i))
          current.add(storage);
      });
    }
    const std::size_t older = n - 1 - i;
    if (history::isLive(deltas[older])) {
      forEachPresent(deltas[older]->previous_, [&](const Uuid& uuid, const ObjectStorage& storage) {
        if (presentEntry(previous, uuid) || lifecycles.createdEarlierThan(uuid, older)) return;
        if (presentEntry(current, uuid) == storage) {
          current.remove(storage);
        } else {
          previous.add(storage);
        }
      });
    }
    if (history::isLive(deltas[i]) && deltas[i]->isSnapshot_) composed.setIsSnapshot(true);
  }
  transaction.commit();
  return result;
}

}  // namespace kiv
