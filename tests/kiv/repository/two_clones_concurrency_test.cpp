// Two clones of one bare origin take turns: each catches up with what the other pushed,
// edits, and pushes on a worker thread; both observe the origin, so every push pulls into
// both clones on the notifier's threads. Run under ThreadSanitizer, the hand-offs the
// futures make must be the only synchronisation the library needs.
#include "kiv/metamodel/delta_impl.h"
#include "kiv/repository/repository_fixture.h"
#include "qf/zero/io/json_change_report_synchronizer.h"

#include <random>

namespace repository_test {
namespace {

class TwoClones : public ::testing::Test, public RepositoryModels {
 protected:
  // The state a user model must show at the workspace's context, built in a fresh model.
  State contextState(const Clone& clone) {
    const Model fresh = Model::create();
    kiv::Delta snapshot = clone.workspace->getContext()->getSnapshot();
    qf::zero::io::JSONChangeReportSynchronizer::applyChangeReportVerbatim(
        snapshot->toChangeReport(), fresh, std::make_unique<kiv::ElementReuseModelBuilder>());
    {
      qf::zero::Transaction transaction = repositories->beginTransaction();
      snapshot.destroy();
      transaction.commit();
    }
    return stateOf(fresh);
  }

  // One turn: catch up, edit once, push and wait for the push (and the pulls it set off).
  void takeTurn(Clone& clone, std::mt19937& random, int round) {
    clone.workspace->updateContext();
    ASSERT_TRUE(clone.workspace->canCommit());
    const auto nodes =
        clone.user->getInstances(tm.node, qf::zero::query::SearchClassMatchMode::IncludeSubclasses);
    if (nodes.empty() || random() % 3 == 0) {
      addNode(clone, u"n" + std::u16string(1, static_cast<char16_t>(u'a' + round % 26)));
    } else {
      rename(clone, nodes[random() % nodes.size()],
             u"r" + std::u16string(1, static_cast<char16_t>(u'a' + round % 26)));
    }
    std::future<void> pushed =
        clone.workspace->push(round % 2 == 0 ? kiv::PushMode::TryPush : kiv::PushMode::MergeFirst);
    ASSERT_TRUE(finishes(pushed)) << "push of round " << round << " did not end";
    pushed.get();
  }
};

TEST_F(TwoClones, TakeTurnsPushingWhileBothObserveTheOrigin) {
  Clone ann = cloneOrigin();
  Clone bob = cloneOrigin();
  ann.repository->startObservingOrigin();
  bob.repository->startObservingOrigin();
  std::mt19937 random(20261124);
  constexpr int rounds = 200;
  for (int round = 0; round < rounds; ++round) {
    SCOPED_TRACE(round);
    takeTurn(round % 2 == 0 ? ann : bob, random, round);
    if (HasFatalFailure()) return;
    if (round % 25 == 24) {
      // Now and then a clone pulls itself, on the workspace's worker, which also rewrites
      // its user model there.
      std::future<void> pulled = bob.workspace->pull();
      ASSERT_TRUE(finishes(pulled));
      pulled.get();
    }
  }
  ann.workspace->updateContext();
  bob.workspace->updateContext();
  EXPECT_TRUE(origin->isEquivalent(ann.repository));
  EXPECT_TRUE(origin->isEquivalent(bob.repository));
  EXPECT_TRUE(ann.repository->isEquivalent(bob.repository));
  EXPECT_EQ(stateOf(ann.user), contextState(ann));
  EXPECT_EQ(stateOf(bob.user), contextState(bob));
  EXPECT_EQ(stateOf(ann.user), stateOf(bob.user));
  ann.repository->stopObservingOrigin();
  bob.repository->stopObservingOrigin();
}

// With an executor, a notice only queues the pull; the clone pulls when its own thread
// runs the queue, between its edits.
TEST_F(TwoClones, AnExecutorDefersTheNoticedPullToTheObserversThread) {
  Clone ann = cloneOrigin();
  Clone bob = cloneOrigin();
  auto notices = std::make_shared<kiv::QueuedNoticeExecutor>();
  kiv::setNoticeExecutor(bob.repository, notices);
  bob.repository->startObservingOrigin();
  addNode(ann, u"a");
  std::future<void> pushed = ann.workspace->push(kiv::PushMode::TryPush);
  ASSERT_TRUE(finishes(pushed));
  pushed.get();
  EXPECT_EQ(notices->pendingCount(), 1u);
  EXPECT_NE(bob.tip(), ann.tip()) << "the pull ran before the observer asked for it";
  EXPECT_EQ(notices->runPending(), 1u);
  EXPECT_EQ(bob.tip(), ann.tip());
  bob.workspace->updateContext();
  EXPECT_EQ(stateOf(bob.user), stateOf(ann.user));
  kiv::setNoticeExecutor(bob.repository, nullptr);
  bob.repository->stopObservingOrigin();
}

}  // namespace
}  // namespace repository_test
