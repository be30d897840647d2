// The answers of Commit::find along one first-parent line, kept beside the history model.
//
// For a tip commit, per element UUID: the storage that the nearest commit on the tip's
// first-parent line (the tip first) holds for it, back to and including the first
// snapshot. Recording a commit asks for the state of each changed element at its parent,
// the branch tip; the walk back to where an element was last recorded grows with the
// history, a look-up here does not.
//
// The line is indexed once and then moved forward a commit at a time, when a question
// comes from a child of the indexed tip. Its commits and deltas are watched: any change
// to one of them (a delta gaining or losing a storage, a parent or delta replaced, a
// destruction), committed or not, makes the index stale, and it is rebuilt at the next
// question. A line with a proxy in it (a parent or storage not resident) is not indexed:
// its questions go to the walk.
#pragma once

#include "kiv/metamodel/commit.h"
#include "kiv/metamodel/object_storage.h"
#include "qf/zero/core/internal/flat_table.h"
#include "qf/zero/core/uuid.h"

#include <cstdint>
#include <optional>

namespace qf::zero {
class ModelImpl;
}

namespace kiv::history {

class FirstParentStates {
 public:
  // The index kept beside `model`, made on first use.
  static FirstParentStates& of(qf::zero::ModelImpl& model);

  // What the walk from `tip` finds for `element`: a storage, or a null handle when the
  // line holds none. nullopt when the index cannot answer; the caller walks.
  // REQUIRES: `tip` is a live commit of the model.
  std::optional<ObjectStorage> find(const Commit& tip, const qf::zero::Uuid& element);

 private:
  // Moves the index from the tip to its child `tip`.
  void extendTo(const Commit& tip);
  void rebuild(const Commit& tip);
  // Takes in the storages of one commit's delta: nearer than everything held so far, or
  // farther. False when the delta holds an entry that is not a resident storage.
  bool absorb(const Commit& commit, bool nearest);
  void watch(const qf::zero::ModelElement& element);

  Commit tip_;
  Commit lastMiss_;                // the tip of the last question the index could not take
  bool usable_ = false;            // false: the tip's line holds a proxy
  std::uint64_t seenChanges_ = 0;  // the model's watched-change count when last in step
  // By element UUID, which a peer may choose: keyed with an unpredictable seed.
  qf::zero::internal::FlatTable<qf::zero::Uuid, ObjectStorage> states_{qf::zero::internal::randomTableSeed()};
};

}  // namespace kiv::history
