// The composed states of recent commits, kept beside the history model, so that a snapshot
// costs the commits since a kept state and not the whole first-parent line.
//
// A snapshot composes a commit's delta with its first parents' back to an initial commit or
// a snapshot delta. Composing a line from its oldest delta forward, per element, gives:
//  - the newest "after" that no newer deletion undoes, for every element whose "befores"
//    all come after its oldest creation (nearly every element: a line that starts at an
//    initial commit creates what it later changes); such an element's outcome does not
//    depend on where the line ends, so it is carried forward a delta at a time;
//  - for any other element (one the line's first delta already knew, as a merge's snapshot
//    records), its entries, replayed against the line's length when asked: the composition
//    interleaves newest "afters" with oldest "befores", and where an "after" is the very
//    storage of a "before" the outcome depends on that interleaving.
// Both give exactly what Delta::compose gives for the whole line.
//
// Kept states: the commit asked about, and along a line composed here, commits every
// kCheckpointDistance back from it (a merge asks for the state of its base, a few commits
// back), at most kKeptStates in all, the least recently used dropped first. The commits and
// deltas of a kept line are watched: any change to one of them, or the undoing of one by a
// cancelled transaction, drops every kept state. A line with an entry or parent that is not
// resident is composed directly and not kept.
#pragma once

#include "history/composed_state.h"
#include "kiv/metamodel/commit.h"

#include <cstddef>
#include <cstdint>
#include <list>
#include <memory>
#include <unordered_map>

namespace qf::zero {
class ModelImpl;
}

namespace kiv::history {

class SnapshotStates {
 public:
  static constexpr std::size_t kKeptStates = 16;
  static constexpr std::size_t kCheckpointDistance = 32;

  // The states kept beside `model`, made on first use.
  static SnapshotStates& of(qf::zero::ModelImpl& model);

  // What getSnapshot of `commit` holds. REQUIRES: a live commit.
  ComposedState stateOf(const Commit& commit);

  // Off: every state is composed from the line's deltas, as without this class; for tests
  // that compare the two. On by default.
  void setEnabled(bool enabled);

  struct LineState;  // per element, what the line composed so far holds

 private:
  std::shared_ptr<const LineState> kept(const Commit& commit);
  void keep(const Commit& commit, std::shared_ptr<const LineState> state);

  bool enabled_ = true;
  std::uint64_t seenChanges_ = 0;
  // A kept state holds its commit, so that no other commit can take its address.
  struct Kept {
    Commit commit;
    std::shared_ptr<const LineState> state;
    std::list<const Commit::Impl*>::iterator recency;
  };
  std::list<const Commit::Impl*> recency_;  // most recently used first
  std::unordered_map<const Commit::Impl*, Kept> states_;
};

}  // namespace kiv::history
