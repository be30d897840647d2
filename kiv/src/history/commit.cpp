#include "history/ancestry.h"
#include "history/composed_state.h"
#include "history/first_parent_states.h"
#include "history/history_support.h"
#include "history/snapshot_states.h"
#include "kiv/messages/messages.h"
#include "kiv/metamodel/commit_impl.h"
#include "kiv/metamodel/delta_impl.h"
#include "kiv/metamodel/object_storage_impl.h"

#include <algorithm>
#include <unordered_set>

namespace kiv {

namespace {

Commit self(const Commit::Impl* commit) { return Commit(const_cast<Commit::Impl*>(commit)); }

Delta deltaToRecordInto(Commit::Impl& commit) {
  Delta delta = commit.getDelta();
  if (history::isLive(delta)) return delta;
  delta = Delta::create(commit.getModel());
  commit.setDelta(delta);
  return delta;
}

ObjectStorage storageOf(const Commit::Impl& commit, const qf::zero::ModelElement& element) {
  const ObjectStorage storage = ObjectStorage::create(commit.getModel());
  storage->setContent(element);
  return storage;
}

// The walk that the index answers for: from `commit` back along first parents.
ObjectStorage findByWalk(Commit commit, const qf::zero::Uuid& uuid) {
  while (history::isLive(commit)) {
    const Delta delta = commit->getDelta();
    if (history::isLive(delta)) {
      if (ObjectStorage storage = delta->getCurrent(uuid)) return storage;
      if (delta->getIsSnapshot()) return {};
    }
    commit = commit->getParent();
  }
  return {};
}

bool hasChildren(const Commit::Impl& commit) {
  const void* parentsProperty = MetaPackageKiv::getInstance().getCommit_parents().getImpl();
  for (const auto& incoming : commit.incomingReferences()) {
    if (incoming.property == parentsProperty) return true;
  }
  return false;
}

}  // namespace

bool Commit::Impl::isInitial() const { return parents_.size() == 0; }

bool Commit::Impl::isMerge() const { return parents_.size() > 1; }

bool Commit::Impl::isEmpty() const { return !history::isLive(getDelta()); }

Commit Commit::Impl::getParent() const {
  if (parents_.size() == 0) return {};
  return qf::zero::elementCast<Commit>(parents_.resolveProxy(parents_.basicAt(0)));
}

// History must stay acyclic: the walks keep no visited set. Only a commit that already
// has children can close a loop, so a new commit pays for no walk.
void Commit::Impl::addParent(const Commit& parent) {
  history::requireLive(parent, u"kiv.Commit.addParent");
  if (parent.getImpl() == this || (hasChildren(*this) && history::reaches(parent, *this))) {
    qf::zero::reportException(messages::CannotAddParent(parent.identifier()));
  }
  qf::zero::Transaction transaction = history::beginTransactionOn(*this);
  getParentsMutable().add(parent);
  transaction.commit();
}

void Commit::Impl::addCreated(const qf::zero::ModelElement& current) {
  qf::zero::Transaction transaction = history::beginTransactionOn(*this);
  const ObjectStorage storage = storageOf(*this, current);
  deltaToRecordInto(*this)->addCreated(storage);
  transaction.commit();
}

// The previous state is shared with the commit that recorded it, not copied.
void Commit::Impl::addUpdated(const qf::zero::ModelElement& current) {
  history::requireLive(current, u"kiv.Commit.addUpdated");
  const ObjectStorage previous = find(current.getUuid());
  if (!previous || previous->isEmpty()) {
    qf::zero::reportException(messages::NoSuchElementCur(current.identifier()));
  }
  qf::zero::Transaction transaction = history::beginTransactionOn(*this);
  const ObjectStorage storage = storageOf(*this, current);
  deltaToRecordInto(*this)->addUpdated(previous, storage);
  transaction.commit();
}

void Commit::Impl::addDeleted(const qf::zero::ModelElement& current) {
  qf::zero::Transaction transaction = history::beginTransactionOn(*this);
  const ObjectStorage storage = storageOf(*this, current);
  deltaToRecordInto(*this)->addDeleted(storage);
  transaction.commit();
}

// First parents only: a state recorded only on a merged-in side line is not found. A
// snapshot holds the whole state, so the walk ends there. This commit's own delta may
// still be growing, so it is read directly; the line behind it is indexed.
ObjectStorage Commit::Impl::find(const qf::zero::Uuid& uuid) const {
  if (!isLive()) return {};
  if (const Delta delta = getDelta(); history::isLive(delta)) {
    if (ObjectStorage storage = delta->getCurrent(uuid)) return storage;
    if (delta->getIsSnapshot()) return {};
  }
  Commit commit = getParent();
  if (!history::isLive(commit)) return {};
  if (auto indexed = history::FirstParentStates::of(*getModelImpl()).find(commit, uuid)) return *indexed;
  return findByWalk(commit, uuid);
}

// The deltas from this commit back along first parents to an initial commit or to the
// first snapshot, composed most recent first; a commit without a delta counts as one that
// recorded nothing. The composition usually starts from a state kept for a recent commit.
Delta Commit::Impl::getSnapshot() const {
  qf::zero::Transaction transaction = history::beginTransactionOn(*this);
  const history::ComposedState state = history::snapshotState(self(this));
  const Delta snapshot = Delta::create(getModel());
  const auto elementsInUuidOrder = [](const history::StateEntries& entries) {
    std::vector<qf::zero::ModelElement> ordered;
    ordered.reserve(entries.size());
    for (const auto& [uuid, storage] : history::inUuidOrder(entries)) ordered.push_back(*storage);
    return ordered;
  };
  snapshot->getCurrentMutable().addAll(elementsInUuidOrder(state.current));
  snapshot->getPreviousMutable().addAll(elementsInUuidOrder(state.previous));
  snapshot->setIsSnapshot(true);
  transaction.commit();
  return snapshot;
}

namespace history {

std::vector<Delta> snapshotDeltas(const Commit& commit) {
  std::vector<Delta> deltas{commit->getDelta()};
  for (Commit at = commit; !at->isInitial();) {
    const Delta delta = at->getDelta();
    if (isLive(delta) && delta->getIsSnapshot()) break;
    at = at->getParent();
    if (!at) break;
    deltas.push_back(at->getDelta());
  }
  return deltas;
}

ComposedState snapshotStateComposed(const Commit& commit) {
  ComposedState state = composeState(snapshotDeltas(commit));
  state.isSnapshot = true;
  return state;
}

ComposedState snapshotState(const Commit& commit) {
  return SnapshotStates::of(*commit->getModelImpl()).stateOf(commit);
}

}  // namespace history

// The change from the state at `other` to the state at this commit. Without a path back
// to `other` it goes from other's state through nothing: this snapshot composed with the
// inverse of other's. The intermediate snapshots are destroyed; the result shares their
// storages, which belong to the recorded commits.
Delta Commit::Impl::diff(const Commit& other) const {
  history::requireLive(other, u"kiv.Commit.diff");
  const std::vector<Commit> path = findPath(other);
  qf::zero::Transaction transaction = history::beginTransactionOn(*this);
  Delta result;
  if (path.empty()) {
    std::vector<Delta> deltas{getSnapshot()};
    Delta theirs;
    if (!other->isInitial()) {
      theirs = other->getSnapshot();
      deltas.push_back(theirs->invert());
    }
    result = Delta::Impl::compose(deltas);
    for (Delta& scratch : deltas) scratch.destroy();
    if (theirs) theirs.destroy();
  } else {
    // The last commit of the path is `other`, whose delta is part of its own state.
    std::vector<Delta> deltas;
    for (std::size_t i = 0; i + 1 < path.size(); ++i) deltas.push_back(path[i]->getDelta());
    const bool anyRecorded =
        std::any_of(deltas.begin(), deltas.end(), [](const Delta& d) { return history::isLive(d); });
    // Commits that recorded nothing compose to nothing.
    result = deltas.empty() || anyRecorded ? Delta::Impl::compose(deltas) : Delta::create(getModel());
  }
  transaction.commit();
  return result;
}

bool Commit::Impl::isEqual(const Commit& other) const {
  if (!history::isLive(other) || other.getUuid() != getUuid()) return false;
  const Delta mine = getDelta();
  const Delta theirs = other->getDelta();
  const bool sameDelta = history::isLive(mine) ? mine->isEqual(theirs) : !history::isLive(theirs);
  return sameDelta && other->user_ == user_ && other->message_ == message_ && other->dateTime_ == dateTime_;
}

// Storages shared with other deltas go too: callers wipe out only commits whose storages
// nothing else needs.
void Commit::Impl::wipeOut() {
  qf::zero::Transaction transaction = history::beginTransactionOn(*this);
  if (Delta delta = getDelta(); history::isLive(delta)) {
    std::vector<ObjectStorage> storages = delta->getPrevious().getTypedValues();
    const std::vector<ObjectStorage> currents = delta->getCurrent().getTypedValues();
    storages.insert(storages.end(), currents.begin(), currents.end());
    for (ObjectStorage& storage : storages) {
      if (storage.isLive()) storage.destroy();
    }
    delta.destroy();
  }
  self(this).destroy();
  transaction.commit();
}

}  // namespace kiv
