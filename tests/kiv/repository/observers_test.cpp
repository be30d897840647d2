// Observers of a repository: when its listener is kept, which notices go to local and
// remote observers, and which transactions cause one.
#include "kiv/repository/repository_fixture.h"
#include "kiv/repository/repository_listener.h"
#include "qf/zero/io/in_process_channel.h"
#include "qf/zero/io/packet_transport.h"

#include <condition_variable>
#include <functional>
#include <memory>
#include <mutex>

namespace repository_test {
namespace {

using repository_test::PrintTo;

using qf::zero::io::JSONPacket;

// The far end of a repository's synchronisation channel. It counts the change notices that
// arrive; a marker sent from the repository's end after them tells when all have arrived,
// since one channel delivers in order.
class RemotePeer {
 public:
  explicit RemotePeer(std::shared_ptr<qf::zero::io::SynchronizationChannel> channel)
      : transport_(std::move(channel)) {
    transport_.setPacketHandler("RepositoryModified", [this](const JSONPacket& packet) {
      const std::lock_guard<std::mutex> lock(mutex_);
      ++notices_;
      if (!packet.getJson().is_null()) ++noticesWithBody_;
      return boost::optional<JSONPacket>();
    });
    transport_.setPacketHandler("Marker", [this](const JSONPacket&) {
      {
        const std::lock_guard<std::mutex> lock(mutex_);
        ++markers_;
      }
      arrived_.notify_all();
      return boost::optional<JSONPacket>();
    });
  }

  // The type of the repository's reply to a request of this type.
  std::string ask(const std::string& type) {
    return transport_.sendAndExpectPacket(JSONPacket(type, nullptr), "OK", std::chrono::seconds(30))
        .getType();
  }

  // Waits at most 30 s until every packet `repository` sent so far has arrived.
  bool drain(const kiv::Repository& repository) {
    int expected = 0;
    {
      const std::lock_guard<std::mutex> lock(mutex_);
      expected = ++markersSent_;
    }
    repository->getPacketTransport()->sendPacket(JSONPacket("Marker", nullptr));
    std::unique_lock<std::mutex> lock(mutex_);
    return arrived_.wait_for(lock, std::chrono::seconds(30), [&] { return markers_ >= expected; });
  }

  int notices() const {
    const std::lock_guard<std::mutex> lock(mutex_);
    return notices_;
  }
  int noticesWithBody() const {
    const std::lock_guard<std::mutex> lock(mutex_);
    return noticesWithBody_;
  }

 private:
  mutable std::mutex mutex_;
  std::condition_variable arrived_;
  int notices_ = 0, noticesWithBody_ = 0, markers_ = 0, markersSent_ = 0;
  // Last, so that it closes, and its handlers stop, before the counters go.
  qf::zero::io::PacketTransport transport_;
};

class ObserverModels : public RepositoryModels {
 public:
  // Connects the origin to a new remote peer.
  std::unique_ptr<RemotePeer> connectPeer() {
    auto [near, far] = qf::zero::io::InProcessChannel::createPair();
    origin->setSynchronizationChannel(near);
    return std::make_unique<RemotePeer>(far);
  }

  // A clone that observes the origin and keeps each notice, unrun, in `notices`.
  Clone watchingClone(const std::shared_ptr<kiv::QueuedNoticeExecutor>& notices) {
    Clone clone = cloneOrigin();
    kiv::setNoticeExecutor(clone.repository, notices);
    clone.repository->startObservingOrigin();
    return clone;
  }

  // `count` new commits, each the child of the one before, the first a child of the tip.
  void commitOnOrigin(int count) {
    const kiv::Branch master = origin->getHead();
    qf::zero::Transaction transaction = repositories->beginTransaction();
    for (int i = 0; i < count; ++i) {
      const kiv::Commit commit = kiv::Commit::create(repositories);
      if (const kiv::Commit tip = master->getTip()) commit->addParent(tip);
      master->commit(commit);
    }
    transaction.commit();
  }

  void inTransaction(const std::function<void()>& change, bool commit = true) {
    qf::zero::Transaction transaction = repositories->beginTransaction();
    change();
    if (commit) transaction.commit();
  }
};

class Observers : public ::testing::Test, public ObserverModels {};

// Removing an observer keeps the listener only while local observers remain and remote
// ones are registered, both.
struct ListenerRuleCase {
  std::string name;
  int localObservers;
  int remoteObservers;
  bool removeStranger;  // remove a repository that never observed
  bool kept;
};

class ListenerRule : public ::testing::TestWithParam<ListenerRuleCase>, public ObserverModels {};

TEST_P(ListenerRule, OnRemovingAnObserver) {
  const ListenerRuleCase& row = GetParam();
  const auto notices = std::make_shared<kiv::QueuedNoticeExecutor>();
  std::vector<kiv::LocalRepository> observers;
  for (int i = 0; i < row.localObservers; ++i) {
    observers.push_back(cloneOrigin().repository);
    kiv::setNoticeExecutor(observers.back(), notices);
    origin->addRepositoryObserver(observers.back());
  }
  const kiv::LocalRepository stranger = cloneOrigin().repository;
  inTransaction([&] { origin->setNumRemoteObservers(row.remoteObservers); });
  // Held by address only: a reference held here would keep a dropped listener listening.
  const kiv::RepositoryListener* const listener = origin->getRepositoryListener().get();
  ASSERT_TRUE(listener);
  const kiv::protocol::History history = listener->getHistory();
  ASSERT_TRUE(history.isLive());

  origin->removeRepositoryObserver(row.removeStranger ? stranger : observers.front());

  const std::size_t left = observers.size() - (row.removeStranger ? 0 : 1);
  EXPECT_EQ(origin->getObservers().size(), left);
  EXPECT_EQ(origin->getNumRemoteObservers(), row.remoteObservers);
  if (row.kept) {
    EXPECT_EQ(origin->getRepositoryListener().get(), listener);
    EXPECT_TRUE(history.isLive());
  } else {
    EXPECT_FALSE(origin->getRepositoryListener());
    EXPECT_FALSE(history.isLive()) << "a dropped listener's history goes with it";
  }
  commitOnOrigin(1);
  EXPECT_EQ(notices->pendingCount(), row.kept ? left : 0u)
      << "only a kept listener still tells the observers left";
}

INSTANTIATE_TEST_SUITE_P(Rows, ListenerRule,
                         ::testing::Values(ListenerRuleCase{"LocalAndRemoteLeft", 2, 1, false, true},
                                           ListenerRuleCase{"ManyOfBothLeft", 3, 3, false, true},
                                           ListenerRuleCase{"OnlyRemoteLeft", 1, 2, false, false},
                                           ListenerRuleCase{"OnlyLocalLeft", 2, 0, false, false},
                                           ListenerRuleCase{"NoneLeft", 1, 0, false, false},
                                           ListenerRuleCase{"StrangerWithRemote", 1, 1, true, true},
                                           ListenerRuleCase{"StrangerWithoutRemote", 2, 0, true, false}),
                         CaseName());

TEST_F(Observers, EachAddedObserverIsKeptOnceAndGetsAFreshListener) {
  Clone watcher = cloneOrigin();
  origin->addRepositoryObserver(watcher.repository);
  const std::shared_ptr<kiv::RepositoryListener> first = origin->getRepositoryListener();
  const kiv::protocol::History firstHistory = first->getHistory();
  origin->addRepositoryObserver(watcher.repository);
  EXPECT_EQ(origin->getObservers().size(), 1u);
  ASSERT_TRUE(origin->getRepositoryListener());
  EXPECT_NE(origin->getRepositoryListener(), first);
  EXPECT_FALSE(firstHistory.isLive()) << "the replaced listener's history is not left behind";
}

// Remote observers register and leave by packets; one notice to them is one packet
// without a body, however many there are.
struct RemoteNoticeCase {
  std::string name;
  int added, removed;
  int registered, packets;
  bool listening;  // a leaving remote observer drops the listener when no local one is left
};

class RemoteNotices : public ::testing::TestWithParam<RemoteNoticeCase>, public ObserverModels {};

TEST_P(RemoteNotices, OnePacketForAnyNumberOfRemoteObservers) {
  const RemoteNoticeCase& row = GetParam();
  const std::unique_ptr<RemotePeer> peer = connectPeer();
  for (int i = 0; i < row.added; ++i) ASSERT_EQ(peer->ask("AddRemoteObserver"), "OK");
  for (int i = 0; i < row.removed; ++i) ASSERT_EQ(peer->ask("RemoveRemoteObserver"), "OK");
  EXPECT_EQ(origin->getNumRemoteObservers(), row.registered);
  EXPECT_EQ(static_cast<bool>(origin->getRepositoryListener()), row.listening);

  origin->notifyObservers();
  ASSERT_TRUE(peer->drain(origin));
  EXPECT_EQ(peer->notices(), row.packets);
  EXPECT_EQ(peer->noticesWithBody(), 0);
}

INSTANTIATE_TEST_SUITE_P(Rows, RemoteNotices,
                         ::testing::Values(RemoteNoticeCase{"NoRemoteObserver", 0, 0, 0, 0, false},
                                           RemoteNoticeCase{"One", 1, 0, 1, 1, true},
                                           RemoteNoticeCase{"Three", 3, 0, 3, 1, true},
                                           RemoteNoticeCase{"ThreeThenTwoLeft", 3, 2, 1, 1, false},
                                           RemoteNoticeCase{"AllLeft", 2, 2, 0, 0, false},
                                           RemoteNoticeCase{"LeftWithoutComing", 0, 1, 0, 0, false}),
                         CaseName());

TEST_F(Observers, RemotePeersHearOfEachTransactionThatChangedABranch) {
  const std::unique_ptr<RemotePeer> peer = connectPeer();
  ASSERT_EQ(peer->ask("AddRemoteObserver"), "OK");
  commitOnOrigin(2);
  ASSERT_TRUE(peer->drain(origin));
  EXPECT_EQ(peer->notices(), 1);
  inTransaction([&] { origin->setName(u"renamed"); });
  commitOnOrigin(1);
  ASSERT_TRUE(peer->drain(origin));
  EXPECT_EQ(peer->notices(), 2);
}

// A peer that went away without leaving is no reason to fail the push that changed the
// origin.
TEST_F(Observers, APushSucceedsAfterARemotePeerVanished) {
  std::unique_ptr<RemotePeer> peer = connectPeer();
  ASSERT_EQ(peer->ask("AddRemoteObserver"), "OK");
  peer.reset();
  Clone pusher = cloneOrigin();
  addNode(pusher, u"a");
  EXPECT_TRUE(completes(pusher.repository->push(kiv::PushMode::TryPush)));
  EXPECT_TRUE(origin->isEquivalent(pusher.repository));
}

// Local observers are told once per committed transaction of the repository model that
// changed a branch of the observed repository: its name, tip or redo stack.
struct TransactionNoticeCase {
  std::string name;
  std::function<void(ObserverModels&)> change;
  std::size_t notices;
};

class TransactionNotices : public ::testing::TestWithParam<TransactionNoticeCase>, public ObserverModels {};

TEST_P(TransactionNotices, OnePerChangingTransaction) {
  const auto notices = std::make_shared<kiv::QueuedNoticeExecutor>();
  Clone watcher = watchingClone(notices);
  EXPECT_EQ(notices->pendingCount(), 0u) << "starting to observe is no change";
  GetParam().change(*this);
  EXPECT_EQ(notices->pendingCount(), GetParam().notices);
}

INSTANTIATE_TEST_SUITE_P(
    Rows, TransactionNotices,
    ::testing::Values(
        TransactionNoticeCase{"TwoCommitsInOneTransaction", [](ObserverModels& m) { m.commitOnOrigin(2); },
                              1},
        TransactionNoticeCase{"TwoSavepointsOfOneTransaction",
                              [](ObserverModels& m) {
                                m.inTransaction([&] {
                                  m.commitOnOrigin(1);
                                  m.commitOnOrigin(1);
                                });
                              },
                              1},
        TransactionNoticeCase{"TwoTransactions",
                              [](ObserverModels& m) {
                                m.commitOnOrigin(1);
                                m.commitOnOrigin(1);
                              },
                              2},
        TransactionNoticeCase{"AfterAnotherObserverCame",
                              [](ObserverModels& m) {
                                m.origin->addRepositoryObserver(m.cloneOrigin().repository);
                                m.commitOnOrigin(1);
                              },
                              1},
        TransactionNoticeCase{"BranchAdded",
                              [](ObserverModels& m) {
                                m.origin->add(m.makeBranch({u"b", "c1"}));
                              },
                              1},
        TransactionNoticeCase{"BranchRemoved", [](ObserverModels& m) { m.origin->remove(u"master"); }, 1},
        TransactionNoticeCase{"RedoStackGrew",
                              [](ObserverModels& m) {
                                const kiv::Commit extra = m.commitLabelled("c1");
                                m.inTransaction(
                                    [&] { m.origin->getHead()->getRedoStackMutable().add(extra); });
                              },
                              1},
        TransactionNoticeCase{"NoBranchChanged",
                              [](ObserverModels& m) {
                                m.inTransaction([&] {
                                  m.origin->setName(u"renamed");
                                  kiv::Commit::create(m.repositories);
                                });
                              },
                              0},
        TransactionNoticeCase{"Cancelled",
                              [](ObserverModels& m) {
                                const kiv::Commit commit = m.commitLabelled("c1");
                                m.inTransaction([&] { m.origin->getHead()->commit(commit); }, false);
                              },
                              0},
        TransactionNoticeCase{"TipMovedAndBack",
                              [](ObserverModels& m) {
                                const kiv::Commit commit = m.commitLabelled("c1");
                                m.inTransaction([&] {
                                  m.origin->getHead()->setTip(commit);
                                  m.origin->getHead()->setTip(kiv::Commit());
                                });
                              },
                              0},
        TransactionNoticeCase{"AnotherRepositorysBranch",
                              [](ObserverModels& m) {
                                Clone other = m.cloneOrigin();
                                m.addNode(other, u"a");
                              },
                              0},
        TransactionNoticeCase{"PushFromAClone",
                              [](ObserverModels& m) {
                                Clone other = m.cloneOrigin();
                                m.addNode(other, u"a");
                                EXPECT_TRUE(completes(other.repository->push(kiv::PushMode::TryPush)));
                              },
                              1}),
    CaseName());

TEST_F(Observers, StoppedObserversHearNothing) {
  const auto notices = std::make_shared<kiv::QueuedNoticeExecutor>();
  Clone watcher = watchingClone(notices);
  watcher.repository->stopObservingOrigin();
  EXPECT_EQ(origin->getObservers().size(), 0u);
  commitOnOrigin(1);
  EXPECT_EQ(notices->pendingCount(), 0u);
  EXPECT_TRUE(raises([&] { origin->startObservingOrigin(); }, kiv::messages::NoOrigin()));
  EXPECT_TRUE(raises([&] { origin->stopObservingOrigin(); }, kiv::messages::NoOrigin()));
}

// A notice is only taken from the origin; the check is made before any pull is handed over.
struct NoticeSourceCase {
  std::string name;
  std::function<kiv::Repository(ObserverModels&)> source;
  bool accepted;
};

class NoticeSource : public ::testing::TestWithParam<NoticeSourceCase>, public ObserverModels {};

TEST_P(NoticeSource, OnlyTheOriginIsPulledFrom) {
  const auto notices = std::make_shared<kiv::QueuedNoticeExecutor>();
  Clone watcher = watchingClone(notices);
  const kiv::Repository source = GetParam().source(*this);
  if (GetParam().accepted) {
    watcher.repository->repositoryModified(source);
    EXPECT_EQ(notices->pendingCount(), 1u);
  } else {
    EXPECT_TRUE(raises([&] { watcher.repository->repositoryModified(source); }, kiv::messages::CannotPull()));
    EXPECT_EQ(notices->pendingCount(), 0u);
  }
}

INSTANTIATE_TEST_SUITE_P(
    Rows, NoticeSource,
    ::testing::Values(
        NoticeSourceCase{"Origin", [](ObserverModels& m) -> kiv::Repository { return m.origin; }, true},
        NoticeSourceCase{"None", [](ObserverModels&) { return kiv::Repository(); }, false},
        NoticeSourceCase{"AnotherClone",
                         [](ObserverModels& m) -> kiv::Repository { return m.cloneOrigin().repository; },
                         false},
        NoticeSourceCase{"AnotherRepository",
                         [](ObserverModels& m) -> kiv::Repository {
                           return m.makeRepository({{u"master", "c1"}});
                         },
                         false}),
    CaseName());

TEST_F(Observers, AStrangeObserverFailsTheNoticeAfterEveryoneWasTold) {
  Clone notifier = cloneOrigin();
  Clone stranger = cloneOrigin();  // a clone of the origin, not of the notifier
  const auto notices = std::make_shared<kiv::QueuedNoticeExecutor>();
  const kiv::LocalRepository follower =
      kiv::LocalRepository::clone(notifier.repository, kiv::RepoType::Regular);
  kiv::setNoticeExecutor(follower, notices);
  notifier.repository->addRepositoryObserver(stranger.repository);
  notifier.repository->addRepositoryObserver(follower);
  EXPECT_TRUE(raises([&] { notifier.repository->notifyObservers(); }, kiv::messages::CannotPull()));
  EXPECT_EQ(notices->pendingCount(), 1u);
}

}  // namespace
}  // namespace repository_test
