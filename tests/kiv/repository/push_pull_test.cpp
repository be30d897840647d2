// Push and pull between clones and their bare origin in one process: what is refused on the
// calling thread, what the origin takes over, and clones that follow the origin.
#include "kiv/merge/default_merge_strategy.h"
#include "kiv/merge/merge_strategy.h"
#include "kiv/metamodel/protocol/history.h"
#include "kiv/repository/repository_fixture.h"
#include "qf/zero/core/messages.h"
#include "qf/zero/core/query.h"
#include "qf/zero/core/report_exception.h"
#include "qf/zero/core/text.h"

#include <functional>

namespace repository_test {
namespace {

using repository_test::PrintTo;

enum class Outcome { Accepted, NoOrigin, PushBare, HeadDelete, CannotPush, MergeFailed };

// The default strategy, except that its second merge fails.
class FailsOnSecondMerge : public kiv::IMergeStrategy {
 public:
  kiv::Commit run(const kiv::Commit& ours, const kiv::Commit& theirs) const override {
    if (++runs_ == 2) qf::zero::reportException(qf0::messages::InvalidValue());
    return inner_->run(ours, theirs);
  }

 private:
  std::shared_ptr<kiv::IMergeStrategy> inner_ = kiv::makeDefaultMergeStrategy();
  mutable int runs_ = 0;
};

// Two clones `a` and `b` of the origin, the commits a row records for its checks, and a
// regular (not bare) origin for the rows that need one.
class SyncModels : public RepositoryModels {
 public:
  Clone a = cloneOrigin();
  Clone b = cloneOrigin();
  kiv::Commit ours, theirs;
  Model regularUser = Model::create();

  // `clone` commits a node and pushes it; the push must be accepted.
  void publish(Clone& clone, const std::u16string& node) {
    addNode(clone, node);
    ASSERT_TRUE(completes(clone.repository->push(kiv::PushMode::TryPush)));
  }

  // `a` and `b` both change "master" and "feature" after sharing a first state of each;
  // `a` pushed its changes, so `b` has diverged on both branches.
  kiv::LocalRepository divergeOnTwoBranches() {
    const auto work = [this](Clone& clone, const std::u16string& onMaster, const std::u16string& onFeature) {
      addNode(clone, onMaster);
      clone.workspace->checkout(u"feature");
      addNode(clone, onFeature);
      clone.workspace->checkout(u"master");
    };
    addNode(a, u"x");
    a.workspace->branch(u"feature");
    addNode(a, u"f");
    a.workspace->checkout(u"master");
    EXPECT_TRUE(completes(a.repository->push(kiv::PushMode::TryPush)));
    EXPECT_TRUE(completes(b.workspace->pull()));
    work(b, u"y", u"g");
    work(a, u"x2", u"f2");
    EXPECT_TRUE(completes(a.repository->push(kiv::PushMode::TryPush)));
    return b.repository;
  }

  std::size_t scratchHistories() const {
    return repositories
        ->getInstances(kiv::protocol::History::metaClass(),
                       qf::zero::query::SearchClassMatchMode::IncludeSubclasses)
        .size();
  }
};

// Runs `action` and checks it raises the outcome's error on the calling thread.
::testing::AssertionResult refusedWith(Outcome outcome, const std::function<void()>& action) {
  switch (outcome) {
    case Outcome::NoOrigin:
      return raises(action, kiv::messages::NoOrigin());
    case Outcome::PushBare:
      return raises(action, kiv::messages::PushBare());
    case Outcome::HeadDelete:
      return raises(action, kiv::messages::HeadDelete());
    case Outcome::CannotPush:
      return raises(action, kiv::messages::CannotPush());
    case Outcome::MergeFailed:
      return raises(action, qf0::messages::InvalidValue());
    case Outcome::Accepted:
      break;
  }
  return ::testing::AssertionFailure() << "not a refusal";
}

struct PushCase {
  std::string name;
  std::function<kiv::LocalRepository(SyncModels&)> arrange;  // returns the pushing repository
  kiv::PushMode mode;
  Outcome outcome;
  std::function<void(SyncModels&)> verify = [](SyncModels&) {};
};

class Push : public ::testing::TestWithParam<PushCase>, public SyncModels {};

TEST_P(Push, RefusedOrTakenOverByTheOrigin) {
  const PushCase& row = GetParam();
  const kiv::LocalRepository pusher = row.arrange(*this);
  ASSERT_FALSE(HasFatalFailure());
  if (row.outcome == Outcome::Accepted) {
    ASSERT_TRUE(completes(pusher->push(row.mode)));
    row.verify(*this);
    EXPECT_EQ(scratchHistories(), 0u) << "the history of a push is dropped once delivered";
    return;
  }
  const std::string before = dumpOf(repositories);
  const State userA = stateOf(a.user), userB = stateOf(b.user);
  std::future<void> stray;
  EXPECT_TRUE(refusedWith(row.outcome, [&] { stray = pusher->push(row.mode); }));
  if (stray.valid()) {
    ASSERT_TRUE(finishes(stray));
  }
  EXPECT_EQ(dumpOf(repositories), before) << "a refused push changes nothing";
  EXPECT_EQ(stateOf(a.user), userA);
  EXPECT_EQ(stateOf(b.user), userB);
}

INSTANTIATE_TEST_SUITE_P(
    Rows, Push,
    ::testing::Values(
        PushCase{"NoOrigin", [](SyncModels& m) { return m.origin; }, kiv::PushMode::TryPush,
                 Outcome::NoOrigin},
        PushCase{"OriginNotBare",
                 [](SyncModels& m) {
                   const kiv::LocalRepository regular =
                       kiv::LocalRepository::create(m.repositories, m.regularUser);
                   regular->init(kiv::RepoType::Regular);
                   return kiv::LocalRepository::clone(regular, kiv::RepoType::Regular);
                 },
                 kiv::PushMode::MergeFirst, Outcome::PushBare},
        PushCase{"OriginHeadNameGone",
                 [](SyncModels& m) {
                   m.addNode(m.a, u"x");
                   m.a.workspace->branch(u"feature");
                   m.a.repository->remove(u"master");
                   return m.a.repository;
                 },
                 kiv::PushMode::MergeFirst, Outcome::HeadDelete},
        PushCase{"DivergedTryPush",
                 [](SyncModels& m) {
                   m.publish(m.a, u"x");
                   m.addNode(m.b, u"y");
                   return m.b.repository;
                 },
                 kiv::PushMode::TryPush, Outcome::CannotPush},
        PushCase{"BehindTryPush",
                 [](SyncModels& m) {
                   m.publish(m.a, u"x");
                   return m.b.repository;
                 },
                 kiv::PushMode::TryPush, Outcome::CannotPush},
        PushCase{"TwoBranchesDivergedTryPush", [](SyncModels& m) { return m.divergeOnTwoBranches(); },
                 kiv::PushMode::TryPush, Outcome::CannotPush},
        PushCase{"SecondMergeFails",
                 [](SyncModels& m) {
                   const kiv::LocalRepository pusher = m.divergeOnTwoBranches();
                   qf::zero::Transaction transaction = m.repositories->beginTransaction();
                   pusher->setIMergeStrategy(std::make_shared<FailsOnSecondMerge>());
                   transaction.commit();
                   return pusher;
                 },
                 kiv::PushMode::MergeFirst, Outcome::MergeFailed},
        PushCase{"TwoBranchesDivergedMergeFirst", [](SyncModels& m) { return m.divergeOnTwoBranches(); },
                 kiv::PushMode::MergeFirst, Outcome::Accepted,
                 [](SyncModels& m) {
                   for (const std::u16string name : {u"master", u"feature"}) {
                     const kiv::Branch mine = m.b.repository->getBranches().container().at(name);
                     EXPECT_TRUE(mine->getTip()->isMerge()) << qf::zero::toUtf8(name);
                   }
                   EXPECT_TRUE(m.origin->isEquivalent(m.b.repository));
                   Clone fresh = m.cloneOrigin();
                   EXPECT_EQ(stateOf(fresh.user).size(), 3u) << "x, x2 and y";
                 }},
        PushCase{"FastForward",
                 [](SyncModels& m) {
                   m.addNode(m.a, u"x");
                   m.addNode(m.a, u"y");
                   return m.a.repository;
                 },
                 kiv::PushMode::TryPush, Outcome::Accepted,
                 [](SyncModels& m) {
                   EXPECT_EQ(m.origin->getHead()->getTip(), m.a.tip());
                   EXPECT_TRUE(m.origin->isEquivalent(m.a.repository));
                 }},
        PushCase{"UpToDateAgain",
                 [](SyncModels& m) {
                   m.publish(m.a, u"x");
                   m.ours = m.a.tip();
                   return m.a.repository;
                 },
                 kiv::PushMode::TryPush, Outcome::Accepted,
                 [](SyncModels& m) {
                   EXPECT_EQ(m.origin->getHead()->getTip(), m.ours);
                   EXPECT_TRUE(m.origin->isEquivalent(m.a.repository));
                 }},
        PushCase{
            "DivergedMergeFirst",
            [](SyncModels& m) {
              m.publish(m.a, u"x");
              m.addNode(m.b, u"y");
              m.ours = m.b.tip();
              m.theirs = m.a.tip();
              return m.b.repository;
            },
            kiv::PushMode::MergeFirst, Outcome::Accepted,
            [](SyncModels& m) {
              const kiv::Commit merged = m.b.tip();
              ASSERT_TRUE(merged);
              EXPECT_TRUE(merged->isMerge());
              EXPECT_EQ(merged->getParents().getTypedValues(), (std::vector<kiv::Commit>{m.ours, m.theirs}));
              EXPECT_EQ(m.origin->getHead()->getTip(), merged);
              EXPECT_TRUE(m.origin->isEquivalent(m.b.repository));
              Clone fresh = m.cloneOrigin();
              EXPECT_EQ(stateOf(fresh.user).size(), 2u) << "the merge holds both sides' nodes";
            }},
        PushCase{"BehindMergeFirst",
                 [](SyncModels& m) {
                   m.publish(m.a, u"x");
                   m.theirs = m.a.tip();
                   return m.b.repository;
                 },
                 kiv::PushMode::MergeFirst, Outcome::Accepted,
                 [](SyncModels& m) {
                   EXPECT_EQ(m.b.tip(), m.theirs) << "nothing of ours to merge: the branch moves forward";
                   EXPECT_EQ(m.origin->getHead()->getTip(), m.theirs);
                   EXPECT_TRUE(m.origin->isEquivalent(m.b.repository));
                 }},
        PushCase{"BranchOnlyOnTheClone",
                 [](SyncModels& m) {
                   m.addNode(m.a, u"x");
                   m.a.workspace->branch(u"feature");
                   m.addNode(m.a, u"f");
                   m.ours = m.a.tip();
                   m.a.workspace->checkout(u"master");
                   return m.a.repository;
                 },
                 kiv::PushMode::TryPush, Outcome::Accepted,
                 [](SyncModels& m) {
                   ASSERT_TRUE(m.origin->canCheckout(u"feature"));
                   const kiv::Branch feature = m.origin->getBranches().container().at(u"feature");
                   EXPECT_EQ(feature->getTip(), m.ours);
                   EXPECT_NE(feature, m.a.repository->getBranches().container().at(u"feature"));
                   EXPECT_EQ(m.origin->getHead()->getName(), u"master");
                   EXPECT_TRUE(m.origin->isEquivalent(m.a.repository));
                 }},
        PushCase{"BranchOnlyOnTheOrigin",
                 [](SyncModels& m) {
                   m.origin->add(m.makeBranch({u"stale", "c1"}));
                   m.addNode(m.a, u"x");
                   return m.a.repository;
                 },
                 kiv::PushMode::TryPush, Outcome::Accepted,
                 [](SyncModels& m) {
                   EXPECT_FALSE(m.origin->canCheckout(u"stale"));
                   EXPECT_TRUE(m.origin->isEquivalent(m.a.repository));
                 }}),
    CaseName());

struct PullCase {
  std::string name;
  std::function<kiv::LocalRepository(SyncModels&)> arrange;  // returns the pulling repository
  Outcome outcome;                                           // HeadDelete arrives in the future
  std::function<void(SyncModels&)> verify = [](SyncModels&) {};
};

class Pull : public ::testing::TestWithParam<PullCase>, public SyncModels {};

TEST_P(Pull, MirrorsTheOrigin) {
  const PullCase& row = GetParam();
  const kiv::LocalRepository puller = row.arrange(*this);
  ASSERT_FALSE(HasFatalFailure());
  const std::string before = dumpOf(repositories);
  if (row.outcome == Outcome::NoOrigin) {
    std::future<void> stray;
    EXPECT_TRUE(raises([&] { stray = puller->pull(); }, kiv::messages::NoOrigin()));
    if (stray.valid()) {
      ASSERT_TRUE(finishes(stray));
    }
    EXPECT_EQ(dumpOf(repositories), before);
    return;
  }
  std::future<void> pulled = puller->pull();
  ASSERT_TRUE(finishes(pulled));
  if (row.outcome == Outcome::HeadDelete) {
    EXPECT_THROW(pulled.get(), Exception<kiv::messages::HeadDelete>);
    EXPECT_EQ(dumpOf(repositories), before) << "a refused pull changes nothing";
    return;
  }
  EXPECT_NO_THROW(pulled.get());
  EXPECT_TRUE(puller->isEquivalent(origin));
  row.verify(*this);
}

INSTANTIATE_TEST_SUITE_P(
    Rows, Pull,
    ::testing::Values(PullCase{"NoOrigin", [](SyncModels& m) { return m.origin; }, Outcome::NoOrigin},
                      PullCase{"NothingNew", [](SyncModels& m) { return m.b.repository; }, Outcome::Accepted},
                      PullCase{"BringsTheOthersCommits",
                               [](SyncModels& m) {
                                 m.publish(m.a, u"x");
                                 m.publish(m.a, u"y");
                                 return m.b.repository;
                               },
                               Outcome::Accepted, [](SyncModels& m) { EXPECT_EQ(m.b.tip(), m.a.tip()); }},
                      PullCase{"BringsANewBranch",
                               [](SyncModels& m) {
                                 m.a.workspace->branch(u"feature");
                                 m.addNode(m.a, u"f");
                                 m.a.workspace->checkout(u"master");
                                 m.publish(m.a, u"x");
                                 return m.b.repository;
                               },
                               Outcome::Accepted,
                               [](SyncModels& m) { EXPECT_TRUE(m.b.repository->canCheckout(u"feature")); }},
                      PullCase{"DropsABranchOnlyHere",
                               [](SyncModels& m) {
                                 m.b.workspace->branch(u"local");
                                 m.addNode(m.b, u"l");
                                 m.b.workspace->checkout(u"master");
                                 return m.b.repository;
                               },
                               Outcome::Accepted,
                               [](SyncModels& m) { EXPECT_FALSE(m.b.repository->canCheckout(u"local")); }},
                      PullCase{"HeadMissingOnTheOrigin",
                               [](SyncModels& m) {
                                 m.publish(m.a, u"x");
                                 m.b.workspace->branch(u"local");
                                 return m.b.repository;
                               },
                               Outcome::HeadDelete}),
    CaseName());

class Follow : public ::testing::Test, public SyncModels {};

TEST_F(Follow, AWorkspacePullBringsTheUserModelAlong) {
  publish(a, u"x");
  publish(a, u"y");
  ASSERT_TRUE(completes(b.workspace->pull()));
  EXPECT_EQ(b.workspace->getContext(), a.tip());
  EXPECT_EQ(stateOf(b.user), stateOf(a.user));
  EXPECT_TRUE(b.workspace->canCommit());
}

// Clones observing the origin pull when another clone's push reaches it: at once without
// an executor, when the application runs the queued notice with one.
TEST_F(Follow, ObservingClonesPullWhenAnotherClonePushes) {
  Clone queued = cloneOrigin();
  const auto notices = std::make_shared<kiv::QueuedNoticeExecutor>();
  kiv::setNoticeExecutor(queued.repository, notices);
  for (Clone* clone : {&a, &b, &queued}) clone->repository->startObservingOrigin();
  Clone idle = cloneOrigin();

  for (const std::u16string node : {u"x", u"y"}) {
    publish(a, node);
    ASSERT_FALSE(HasFatalFailure());
    EXPECT_TRUE(b.repository->isEquivalent(origin)) << "pulled before the push ended";
    EXPECT_EQ(b.tip(), a.tip());
    EXPECT_FALSE(queued.repository->isEquivalent(origin));
    ASSERT_TRUE(notices->waitForWork(std::chrono::seconds(30)));
    std::size_t ran = 0;
    std::future<void> running = std::async(std::launch::async, [&] { ran = notices->runPending(); });
    ASSERT_TRUE(finishes(running));
    EXPECT_EQ(ran, 1u);
    EXPECT_TRUE(queued.repository->isEquivalent(origin));
  }
  EXPECT_FALSE(idle.repository->isEquivalent(origin));

  b.repository->stopObservingOrigin();
  publish(a, u"z");
  EXPECT_FALSE(b.repository->isEquivalent(origin));
}

}  // namespace
}  // namespace repository_test
