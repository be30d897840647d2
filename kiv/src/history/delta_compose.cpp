// Delta::compose: one delta for a sequence of deltas, most recent first.
#include "history/composed_state.h"
#include "history/history_support.h"
#include "kiv/messages/messages.h"
#include "kiv/metamodel/delta_impl.h"
#include "qf/zero/core/internal/flat_table.h"

#include <algorithm>
#include <bit>
#include <cstdint>
#include <cstring>
#include <unordered_map>
#include <unordered_set>

namespace kiv {

namespace {

using history::forEachPresent;
using history::presentEntry;
using qf::zero::Uuid;

// For every element of the sequence: the most recent position at which it is deleted and
// the oldest at which it is created. "No more recent delta deletes it" and "no older delta
// creates it" then cost one lookup instead of a walk over the sequence. Creations matter
// only for elements that some delta holds a "before" of, so only theirs are kept: a long
// history's initial delta creates every element, and most are never asked about.
class Lifecycles {
 public:
  explicit Lifecycles(const std::vector<Delta>& deltas) {
    std::unordered_set<Uuid, qf::zero::internal::KeyedUuidHash> withPrevious;
    for (std::size_t position = 0; position < deltas.size(); ++position) {
      if (!history::isLive(deltas[position])) continue;
      const Delta::Impl& delta = *deltas[position].getImpl();
      forEachPresent(delta.getPrevious(), [&](const Uuid& uuid, const ObjectStorage&) {
        withPrevious.insert(uuid);
        if (!presentEntry(delta.getCurrent(), uuid)) mostRecentDeletion_.try_emplace(uuid, position);
      });
    }
    if (withPrevious.empty()) return;
    for (std::size_t position = 0; position < deltas.size(); ++position) {
      if (!history::isLive(deltas[position])) continue;
      const Delta::Impl& delta = *deltas[position].getImpl();
      const auto noteCreation = [&](const Uuid& uuid) {
        if (presentEntry(delta.getCurrent(), uuid) && !presentEntry(delta.getPrevious(), uuid))
          oldestCreation_[uuid] = position;
      };
      // A delta larger than the set is asked about each element of the set instead.
      if (delta.getCurrent().size() > withPrevious.size()) {
        for (const Uuid& uuid : withPrevious) noteCreation(uuid);
        continue;
      }
      for (const auto& [key, held] : delta.getCurrent().container()) {
        // A live entry is filed under its element's UUID, a proxy under the nil UUID.
        if (!key.is_nil() && withPrevious.count(key) == 0) continue;
        const ObjectStorage storage = held.isLive() ? held : history::residentOf(delta.getCurrent(), held);
        if (!storage) continue;
        const Uuid uuid = held.isLive() ? key : storage.getElementUUID().value_or(key);
        if (withPrevious.count(uuid) != 0) noteCreation(uuid);
      }
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
  std::unordered_map<Uuid, std::size_t, qf::zero::internal::KeyedUuidHash> mostRecentDeletion_;
  std::unordered_map<Uuid, std::size_t, qf::zero::internal::KeyedUuidHash> oldestCreation_;
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

// The result of a composition, written either into a new delta or into plain maps.
class DeltaSink {
 public:
  explicit DeltaSink(Delta::Impl& delta)
      : delta_(delta), current_(delta.getCurrentMutable()), previous_(delta.getPreviousMutable()) {}
  ObjectStorage current(const Uuid& uuid) const { return presentEntry(current_, uuid); }
  bool hasPrevious(const Uuid& uuid) const { return static_cast<bool>(presentEntry(previous_, uuid)); }
  void addCurrentUnlessPresent(const Uuid& uuid, const ObjectStorage& storage) {
    if (!current(uuid)) current_.add(storage);
  }
  void removeCurrent(const Uuid&, const ObjectStorage& storage) { current_.remove(storage); }
  void addPrevious(const Uuid&, const ObjectStorage& storage) { previous_.add(storage); }
  void markSnapshot() { delta_.setIsSnapshot(true); }

 private:
  Delta::Impl& delta_;
  history::StorageMap& current_;
  history::StorageMap& previous_;
};

class StateSink {
 public:
  explicit StateSink(history::ComposedState& state) : state_(state) {}
  const ObjectStorage& current(const Uuid& uuid) const { return state_.currentOf(uuid); }
  bool hasPrevious(const Uuid& uuid) const { return state_.previous.find(uuid) != nullptr; }
  void addCurrentUnlessPresent(const Uuid& uuid, const ObjectStorage& storage) {
    state_.current.tryInsert(uuid, storage);
  }
  void removeCurrent(const Uuid& uuid, const ObjectStorage&) { state_.current.erase(uuid); }
  void addPrevious(const Uuid& uuid, const ObjectStorage& storage) {
    state_.previous.tryInsert(uuid, storage);
  }
  void markSnapshot() { state_.isSnapshot = true; }

 private:
  history::ComposedState& state_;
};

// Positions run from 0 (the latest change) to n-1 (the oldest). For each i, the currents
// of delta i are taken newest first (a), then the previouses of delta n-1-i oldest first
// (b). The identity test in (b) sees the result's currents as (a) has left them so far,
// so the outcome depends on this interleaving: an element whose oldest "before" is the
// very storage that is its newest "after" ends as it began and drops out.
template <class Sink>
void composeInto(const std::vector<Delta>& deltas, Sink& sink) {
  const Lifecycles lifecycles(deltas);
  const std::size_t n = deltas.size();
  for (std::size_t i = 0; i < n; ++i) {
    if (history::isLive(deltas[i])) {
      forEachPresent(deltas[i]->getCurrent(), [&](const Uuid& uuid, const ObjectStorage& storage) {
        if (!lifecycles.deletedMoreRecentlyThan(uuid, i)) sink.addCurrentUnlessPresent(uuid, storage);
      });
    }
    const std::size_t older = n - 1 - i;
    if (history::isLive(deltas[older])) {
      forEachPresent(deltas[older]->getPrevious(), [&](const Uuid& uuid, const ObjectStorage& storage) {
        if (sink.hasPrevious(uuid) || lifecycles.createdEarlierThan(uuid, older)) return;
        if (sink.current(uuid) == storage) {
          sink.removeCurrent(uuid, storage);
        } else {
          sink.addPrevious(uuid, storage);
        }
      });
    }
    if (history::isLive(deltas[i]) && deltas[i]->getIsSnapshot()) sink.markSnapshot();
  }
}

}  // namespace

Delta Delta::Impl::compose(const std::vector<Delta>& deltas) {
  const Delta& first = firstLive(deltas);
  qf::zero::Transaction transaction = history::beginTransactionOn(*first.getImpl());
  const Delta result = Delta::create(first.getModel());
  DeltaSink sink(*result.getImpl());
  composeInto(deltas, sink);
  transaction.commit();
  return result;
}

namespace history {

namespace {

// A UUID's bytes as two numbers that order as the bytes do.
std::pair<std::uint64_t, std::uint64_t> orderKey(const Uuid& uuid) noexcept {
  std::uint64_t high;
  std::uint64_t low;
  std::memcpy(&high, uuid.data, sizeof high);
  std::memcpy(&low, uuid.data + sizeof high, sizeof low);
  if constexpr (std::endian::native == std::endian::little) {
    high = __builtin_bswap64(high);
    low = __builtin_bswap64(low);
  }
  return {high, low};
}

}  // namespace

std::vector<std::pair<Uuid, const ObjectStorage*>> inUuidOrder(const StateEntries& entries) {
  // Sorted by keys worked out once per entry, not once per comparison.
  struct Keyed {
    std::pair<std::uint64_t, std::uint64_t> key;
    const Uuid* uuid;
    const ObjectStorage* storage;
  };
  std::vector<Keyed> keyed;
  keyed.reserve(entries.size());
  entries.forEach([&](const Uuid& uuid, const ObjectStorage& storage) {
    keyed.push_back({orderKey(uuid), &uuid, &storage});
  });
  std::sort(keyed.begin(), keyed.end(), [](const Keyed& a, const Keyed& b) { return a.key < b.key; });
  std::vector<std::pair<Uuid, const ObjectStorage*>> ordered;
  ordered.reserve(keyed.size());
  for (const Keyed& entry : keyed) ordered.emplace_back(*entry.uuid, entry.storage);
  return ordered;
}

ComposedState composeState(const std::vector<Delta>& deltas) {
  ComposedState state;
  std::size_t largest = 0;
  for (const Delta& delta : deltas) {
    if (isLive(delta)) largest = std::max(largest, delta->getCurrent().size());
  }
  state.current.reserve(largest);
  StateSink sink(state);
  composeInto(deltas, sink);
  return state;
}

}  // namespace history

}  // namespace kiv
