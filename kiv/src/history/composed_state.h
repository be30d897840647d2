// The state a sequence of deltas composes to, kept in plain maps: the entries that
// Delta::Impl::compose would put in a new delta, for readers that only look at them and
// need no delta element (the three-way comparison reads three such states per merge).
#pragma once

#include "kiv/metamodel/commit_impl.h"
#include "kiv/metamodel/delta_impl.h"

#include <boost/functional/hash.hpp>

#include <unordered_map>
#include <vector>

namespace kiv::history {

using StateEntries = std::unordered_map<qf::zero::Uuid, ObjectStorage, boost::hash<qf::zero::Uuid>>;

struct ComposedState {
  StateEntries current, previous;
  bool isSnapshot = false;

  // The entry for `uuid`, or an empty handle.
  ObjectStorage currentOf(const qf::zero::Uuid& uuid) const;
  ObjectStorage previousOf(const qf::zero::Uuid& uuid) const;
};

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
