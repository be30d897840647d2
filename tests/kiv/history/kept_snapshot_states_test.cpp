// Snapshots that start from kept states against the composition of every delta of the line,
// on seeded random lines whose deltas share storages in every way the composition treats
// specially: an "after" that is the very storage of an older "before" (a revert), "befores"
// older than any creation (a line that starts at a merge's snapshot), deletions and
// re-creations, commits that recorded nothing, and snapshot deltas part-way that cut the
// line. The snapshots are asked in random order, so each is composed from scratch, from a
// kept state behind it, or from a checkpoint, and the lines are changed between questions.
#include "kiv/history/kept_snapshot_states.h"

#include "history_fixture.h"

#include <random>

namespace {

using namespace history_test;
using kiv::Commit;
using kiv::Delta;
using kiv::ObjectStorage;

// The entries of a delta by element UUID, both sides.
struct Entries {
  std::map<Uuid, const void*> current, previous;
  bool operator==(const Entries&) const = default;
};

Entries entriesOf(const Delta& delta) {
  Entries entries;
  for (const ObjectStorage& storage : delta->getCurrent().getTypedValues())
    entries.current[*storage.getElementUUID()] = storage.getImpl();
  for (const ObjectStorage& storage : delta->getPrevious().getTypedValues())
    entries.previous[*storage.getElementUUID()] = storage.getImpl();
  return entries;
}

std::ostream& operator<<(std::ostream& out, const Entries& entries) {
  out << entries.current.size() << " current, " << entries.previous.size() << " previous";
  return out;
}

// The snapshot by its definition: this commit's delta and its first parents', back to an
// initial commit or a snapshot delta, composed most recent first.
Entries composedSnapshot(const Commit& commit, const Model& repository) {
  std::vector<Delta> deltas{commit->getDelta()};
  for (Commit at = commit; !at->isInitial();) {
    if (at->getDelta() && at->getDelta()->getIsSnapshot()) break;
    at = at->getParent();
    deltas.push_back(at->getDelta());
  }
  Delta scratch;
  if (!deltas.front()) deltas.front() = scratch = Delta::create(repository);
  Delta composed = Delta::Impl::compose(deltas);
  Entries entries = entriesOf(composed);
  composed.destroy();
  if (scratch) scratch.destroy();
  return entries;
}

class RandomLine {
 public:
  RandomLine(const Model& repository, std::uint64_t seed) : repository_(repository), random_(seed) {
    for (int i = 0; i < 5; ++i) uuids_.push_back(qf::zero::generateNewUuid());
  }

  // A line of `length` commits on the last one made (or a new initial commit).
  void grow(std::size_t length) {
    for (std::size_t i = 0; i < length; ++i) {
      const Commit commit = Commit::create(repository_);
      // Mostly on the last commit, so lines grow long; now and then on any.
      if (!commits_.empty())
        commit->addParent(commits_[pick(8) == 0 ? pick(commits_.size()) : commits_.size() - 1]);
      if (pick(10) != 0) commit->setDelta(randomDelta(commits_.empty() || pick(25) == 0));
      commits_.push_back(commit);
    }
  }

  const std::vector<Commit>& commits() const { return commits_; }
  std::size_t pick(std::size_t count) {
    return std::uniform_int_distribution<std::size_t>(0, count - 1)(random_);
  }

 private:
  ObjectStorage storageFor(std::size_t element) {
    std::vector<ObjectStorage>& made = storages_[element];
    if (!made.empty() && pick(3) == 0) return made[pick(made.size())];  // the very storage again
    ObjectStorage storage = storageOf(repository_, uuids_[element], std::to_string(made.size()));
    made.push_back(storage);
    return storage;
  }

  Delta randomDelta(bool snapshot) {
    const Delta delta = Delta::create(repository_);
    for (std::size_t element = 0; element < uuids_.size(); ++element) {
      switch (pick(snapshot ? 4 : 6)) {
        case 0:
          delta->addCreated(storageFor(element));
          break;
        case 1:
          delta->addUpdated(storageFor(element), storageFor(element));
          break;
        case 2:
          delta->addDeleted(storageFor(element));
          break;
        default:
          break;  // this delta leaves the element alone
      }
    }
    if (snapshot) delta->setIsSnapshot(true);
    return delta;
  }

  Model repository_;
  std::mt19937_64 random_;
  std::vector<Uuid> uuids_;
  std::map<std::size_t, std::vector<ObjectStorage>> storages_;
  std::vector<Commit> commits_;
};

class KeptSnapshotStates : public ::testing::TestWithParam<std::uint64_t> {
 protected:
  Model repository = Model::create();
};

TEST_P(KeptSnapshotStates, EverySnapshotIsTheCompositionOfItsLine) {
  RandomLine line(repository, GetParam());
  for (int stage = 0; stage < 4; ++stage) {
    line.grow(60);
    for (int question = 0; question < 80; ++question) {
      const Commit commit = line.commits()[line.pick(line.commits().size())];
      SCOPED_TRACE("seed " + std::to_string(GetParam()) + ", stage " + std::to_string(stage));
      Delta snapshot = commit->getSnapshot();
      ASSERT_EQ(entriesOf(snapshot), composedSnapshot(commit, repository));
      snapshot.destroy();
    }
    // A change on a line that states were kept for, once undone by a cancelled transaction
    // after a snapshot saw it, and once for good: no kept state may outlive either.
    for (const bool cancelled : {true, false}) {
      const Commit changed = line.commits()[line.pick(line.commits().size())];
      const Delta delta = changed->getDelta();
      if (!delta || delta->getCurrent().size() == 0) continue;
      qf::zero::Transaction edit = repository->beginTransaction();
      delta->getCurrentMutable().remove(delta->getCurrent().getTypedValues().front());
      changed->getSnapshot();
      line.commits().back()->getSnapshot();
      if (cancelled) {
        edit.cancel();
      } else {
        edit.commit();
      }
    }
    // Commits made on the line and asked for, then cancelled: the states kept for them go
    // with them, and those kept for the line before must still hold.
    const RandomLine before = line;
    qf::zero::Transaction grow = repository->beginTransaction();
    line.grow(12);
    for (std::size_t at = before.commits().size(); at < line.commits().size(); ++at)
      line.commits()[at]->getSnapshot();
    grow.cancel();
    line = before;
  }
}

TEST_P(KeptSnapshotStates, TurnedOffSnapshotsAreTheSame) {
  RandomLine line(repository, GetParam());
  line.grow(100);
  for (int question = 0; question < 40; ++question) {
    const Commit commit = line.commits()[line.pick(line.commits().size())];
    const Delta kept = commit->getSnapshot();
    kiv::keepSnapshotStates(repository, false);
    const Delta composed = commit->getSnapshot();
    kiv::keepSnapshotStates(repository, true);
    ASSERT_EQ(entriesOf(kept), entriesOf(composed)) << "seed " << GetParam();
  }
}

INSTANTIATE_TEST_SUITE_P(Seeds, KeptSnapshotStates, ::testing::Range<std::uint64_t>(1, 13));

}  // namespace
