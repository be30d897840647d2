// The state a sequence of deltas composes to, kept in plain maps: the entries that
// Delta::Impl::compose would put in a new delta, for readers that only look at them and
// need no delta element (the three-way comparison reads three such states per merge).
#pragma once

#include "kiv/metamodel/commit_impl.h"
#include "kiv/metamodel/delta_impl.h"
#include "qf/zero/core/internal/flat_table.h"

#include <utility>
#include <vector>

namespace kiv::history {

// Entries by element UUID, never empty handles. A state of a whole model is read once per
// element and dropped: one array serves it better than a node per entry. Its UUIDs may
// come from a peer, so its hash is keyed with an unpredictable seed.
using StateEntries = qf::zero::internal::FlatTable<qf::zero::Uuid, ObjectStorage>;

struct ComposedState {
  ComposedState() : current(qf::zero::internal::randomTableSeed()), previous(current.seed()) {}

  StateEntries current, previous;
  bool isSnapshot = false;

  // The entry for `uuid`, or an empty handle.
  const ObjectStorage& currentOf(const qf::zero::Uuid& uuid) const { return entryOf(current, uuid); }
  const ObjectStorage& previousOf(const qf::zero::Uuid& uuid) const { return entryOf(previous, uuid); }

  static const ObjectStorage& entryOf(const StateEntries& entries, const qf::zero::Uuid& uuid) {
    static const ObjectStorage none;
    const ObjectStorage* found = entries.find(uuid);
    return found ? *found : none;
  }
};

// The entries in ascending UUID order, the order of a delta's maps: added in this order,
// each goes last in its map.
std::vector<std::pair<qf::zero::Uuid, const ObjectStorage*>> inUuidOrder(const StateEntries& entries);

// The entries of Delta::Impl::compose(deltas), most recent first. Null and destroyed
// deltas count as empty; so does an empty sequence.
ComposedState composeState(const std::vector<Delta>& deltas);

// The entries of commit->getSnapshot(), without making the snapshot delta; usually from a
// state kept for a recent commit (history/snapshot_states.h).
ComposedState snapshotState(const Commit& commit);

// The same, composed from every delta of the commit's line.
ComposedState snapshotStateComposed(const Commit& commit);

// The deltas a snapshot of `commit` composes: its own, then its first parents' back to
// an initial commit or to a snapshot delta, most recent first; null where a commit
// recorded nothing.
std::vector<Delta> snapshotDeltas(const Commit& commit);

}  // namespace kiv::history
