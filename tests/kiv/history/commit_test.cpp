// Commits: recording user elements, finding their stored states, snapshots, diffs,
// equality, wiping out, and the refusal of loops in history.
#include "history_fixture.h"

#include <boost/date_time/posix_time/posix_time.hpp>

namespace {

using namespace history_test;

using Commits = HistoryTest;

std::u16string nameIn(const kiv::ObjectStorage& storage) {
  return qf::zero::toUtf16(storage.getContent().at("content").at("name").get<std::string>());
}

TEST_F(Commits, RecordingStoresEachStateOnceAndSharesThePreviousOne) {
  ModelElement x;
  const kiv::Commit first = record(repository, user, {}, [&] { x = nodeNamed(u"x"); });
  ASSERT_TRUE(first.getDelta());
  const kiv::ObjectStorage created = first.getDelta()->getCurrent(x.getUuid());
  EXPECT_TRUE(first.getDelta()->isCreated(x.getUuid()));
  EXPECT_EQ(nameIn(created), u"x");

  const kiv::Commit second = record(repository, user, {first}, [&] { tm.setName(x, u"y"); });
  EXPECT_TRUE(second.getDelta()->isUpdated(x.getUuid()));
  EXPECT_EQ(second.getDelta()->getPrevious(x.getUuid()), created)
      << "shared with the commit that recorded it";
  EXPECT_EQ(nameIn(second->find(x.getUuid())), u"y");
  EXPECT_EQ(first->find(x.getUuid()), created);

  const kiv::Commit third = record(repository, user, {second}, [&] { x.destroy(); });
  EXPECT_TRUE(third.getDelta()->isDeleted(x.getUuid()));
  EXPECT_EQ(third.getDelta()->getPrevious(x.getUuid()), second->find(x.getUuid()));
  EXPECT_EQ(third->find(x.getUuid()), second->find(x.getUuid()))
      << "find looks at currents only, not at deletions";
}

TEST_F(Commits, UpdatingAnElementWithoutStoredStateIsRefusedAndChangesNothing) {
  const kiv::Commit commit = kiv::Commit::create(repository);
  ModelElement stranger = nodeNamed(u"s");
  const std::size_t elements = repository->getElementCount();
  try {
    commit->addUpdated(stranger);
    FAIL() << "no stored state";
  } catch (const Exception<kiv::messages::NoSuchElementCur>& e) {
    EXPECT_NE(std::string(e.what()).find(stranger.identifier()), std::string::npos) << e.what();
  }
  EXPECT_FALSE(commit.getDelta()) << "the delta is made on the first record only";
  EXPECT_EQ(repository->getElementCount(), elements);
  EXPECT_THROW(commit->addCreated(ModelElement()), Exception<qf0::messages::ElementRequired>);
  EXPECT_EQ(repository->getElementCount(), elements);
}

TEST_F(Commits, FindFollowsFirstParentsAndStopsAtASnapshot) {
  ModelElement x;
  const kiv::Commit root = record(repository, user, {}, [&] { x = nodeNamed(u"root"); });
  const kiv::Commit ours = record(repository, user, {root}, [&] { tm.setName(x, u"ours"); });
  const kiv::Commit theirs = record(repository, user, {root}, [&] { tm.setName(x, u"theirs"); });
  const kiv::Commit merge = kiv::Commit::create(repository);
  merge->addParent(ours);
  merge->addParent(theirs);
  EXPECT_EQ(nameIn(merge->find(x.getUuid())), u"ours") << "a state only on the merged-in line is not found";

  const kiv::Commit cut = kiv::Commit::create(repository);
  cut->addParent(ours);
  cut->setDelta(kiv::Delta::Builder(repository).doSetIsSnapshot(true).create());
  EXPECT_FALSE(cut->find(x.getUuid())) << "a snapshot is the whole state: the walk ends there";
}

TEST_F(Commits, ASnapshotOfACommitWithoutDeltaLeavesOnlyItself) {
  ModelElement x;
  const kiv::Commit root = record(repository, user, {}, [&] { x = nodeNamed(u"x"); });
  const kiv::Commit empty = kiv::Commit::create(repository);
  empty->addParent(root);
  const std::size_t elements = repository->getElementCount();
  const kiv::Delta snapshot = empty->getSnapshot();
  EXPECT_TRUE(snapshot.getIsSnapshot());
  EXPECT_TRUE(snapshot->isCreated(x.getUuid()));
  EXPECT_EQ(repository->getElementCount(), elements + 1) << "no scratch delta is left behind";
  EXPECT_TRUE(kiv::Commit::create(repository)->getSnapshot()->isEmpty());
}

TEST_F(Commits, DiffAgainstItselfHasNothingToCompose) {
  const kiv::Commit root = record(repository, user, {}, [&] { nodeNamed(u"x"); });
  const std::size_t elements = repository->getElementCount();
  EXPECT_THROW(root->diff(root), Exception<kiv::messages::CannotComposeZeroDeltas>);
  EXPECT_EQ(repository->getElementCount(), elements);
  EXPECT_THROW(root->diff(kiv::Commit()), Exception<qf0::messages::ElementRequired>);
}

// Without a path between them, a diff goes through nothing: this side's snapshot
// composed with the inverse of the other's. An initial other contributes no inverse.
TEST_F(Commits, DiffBetweenUnrelatedHistoriesGoesThroughNothing) {
  ModelElement x;
  ModelElement y;
  const Model otherUser = Model::create();
  const kiv::Commit mine = record(repository, user, {}, [&] { x = nodeNamed(u"x"); });
  const kiv::Commit theirRoot =
      record(repository, otherUser, {}, [&] { y = tm.node.instantiate(otherUser); });
  const kiv::Commit theirs = record(repository, otherUser, {theirRoot}, [&] { tm.setName(y, u"y"); });

  const kiv::Delta throughNothing = mine->diff(theirs);
  EXPECT_TRUE(throughNothing->isCreated(x.getUuid()));
  EXPECT_TRUE(throughNothing->isDeleted(y.getUuid()));
  EXPECT_EQ(nameIn(throughNothing->getPrevious(y.getUuid())), u"y");

  const kiv::Delta fromInitial = mine->diff(theirRoot);
  EXPECT_TRUE(fromInitial->isCreated(x.getUuid()));
  EXPECT_FALSE(fromInitial->getPrevious(y.getUuid())) << "the initial commit's own state is not taken out";
}

TEST_F(Commits, DiffAlongAPathLeavesOutTheBasesOwnDelta) {
  ModelElement x;
  const kiv::Commit root = record(repository, user, {}, [&] { x = nodeNamed(u"a"); });
  const kiv::Commit middle = record(repository, user, {root}, [&] { tm.setName(x, u"b"); });
  const kiv::Commit tip = record(repository, user, {middle}, [&] { tm.setName(x, u"c"); });
  const kiv::Delta delta = tip->diff(root);
  EXPECT_TRUE(delta->isUpdated(x.getUuid()));
  EXPECT_EQ(nameIn(delta->getPrevious(x.getUuid())), u"a");
  EXPECT_EQ(nameIn(delta->getCurrent(x.getUuid())), u"c");
  const kiv::Delta back = root->diff(tip);
  EXPECT_TRUE(back->isUpdated(x.getUuid())) << "no path from root to tip: snapshots both ways";
  EXPECT_EQ(nameIn(back->getCurrent(x.getUuid())), u"a");
}

TEST_F(Commits, EqualCommitsAreTheSameRecordedCommit) {
  const auto when = boost::posix_time::time_from_string("2026-11-21 10:00:00");
  const auto commitIn = [&](const Model& model, const qf::zero::Uuid& id, const qf::zero::Uuid& deltaId) {
    return kiv::Commit::Builder(model)
        .doSetUser(u"ann")
        .doSetMessage(u"fix")
        .doSetDateTime(when)
        .doSetDelta(kiv::Delta::create(model, deltaId))
        .create(id);
  };
  const qf::zero::Uuid id = qf::zero::generateNewUuid();
  const qf::zero::Uuid deltaId = qf::zero::generateNewUuid();
  const kiv::Commit mine = commitIn(repository, id, deltaId);
  kiv::Commit copy = commitIn(elsewhere, id, deltaId);
  EXPECT_TRUE(mine->isEqual(copy));
  copy->setDateTime(boost::none);
  EXPECT_FALSE(mine->isEqual(copy));
  EXPECT_FALSE(mine->isEqual(commitIn(Model::create(), qf::zero::generateNewUuid(), deltaId)));
  EXPECT_FALSE(mine->isEqual(commitIn(Model::create(), id, qf::zero::generateNewUuid())));
  EXPECT_FALSE(mine->isEqual(kiv::Commit()));
}

TEST_F(Commits, WipeOutDestroysTheCommitItsDeltaAndItsStoragesEvenShared) {
  ModelElement x;
  const kiv::Commit root = record(repository, user, {}, [&] { x = nodeNamed(u"x"); });
  const kiv::Commit next = record(repository, user, {root}, [&] { tm.setName(x, u"y"); });
  const kiv::ObjectStorage shared = root.getDelta()->getCurrent(x.getUuid());
  const kiv::Delta delta = root.getDelta();
  root->wipeOut();
  EXPECT_FALSE(root.isLive());
  EXPECT_FALSE(delta.isLive());
  EXPECT_FALSE(shared.isLive());
  EXPECT_FALSE(next.getDelta()->getPrevious(x.getUuid()))
      << "the later commit lost its shared previous state";
}

TEST_F(Commits, HistoryCannotLoop) {
  const kiv::Commit a = kiv::Commit::create(repository);
  const kiv::Commit b = kiv::Commit::create(repository);
  b->addParent(a);
  const kiv::Commit c = kiv::Commit::create(repository);
  c->addParent(b);
  EXPECT_THROW(a->addParent(a), Exception<kiv::messages::CannotAddParent>);
  EXPECT_THROW(a->addParent(c), Exception<kiv::messages::CannotAddParent>);
  EXPECT_TRUE(a->isInitial());
  const kiv::Commit side = kiv::Commit::create(repository);
  a->addParent(side);  // a has children, but side does not descend from it
  EXPECT_EQ(c->findAllPaths().front().back(), side);
}

}  // namespace
