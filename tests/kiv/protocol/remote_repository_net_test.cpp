// Repositories over a packet transport: a bare repository served to clients that reach it
// through remote proxies, over in-process channels.
#include "kiv/protocol/network_fixture.h"

namespace repository_test {
namespace {

TEST_F(OverTheNetwork, ClientsCloneEditPushMergeAndPullUntilTheyAgree) {
  RemoteClone a = cloneServed();
  EXPECT_EQ(a.repository->getHead()->getName(), u"master");
  EXPECT_TRUE(a.origin->getIsBare());
  addNode(a, u"from a");
  ASSERT_TRUE(completes(a.workspace->push(kiv::PushMode::TryPush)));

  RemoteClone b = cloneServed();
  EXPECT_EQ(stateOf(b.user), stateOf(a.user)) << "a clone loads what the server holds";
  EXPECT_EQ(b.tip().getUuid(), a.tip().getUuid());

  addNode(a, u"a again");
  addNode(b, u"from b");
  ASSERT_TRUE(completes(a.workspace->push(kiv::PushMode::TryPush)));
  const std::string beforeRefusal = servedDump();
  EXPECT_TRUE(raises([&] { b.workspace->push(kiv::PushMode::TryPush); }, kiv::messages::CannotPush()))
      << "the proxy is brought up to date first, so the divergence is seen before anything is sent";
  EXPECT_EQ(servedDump(), beforeRefusal);
  ASSERT_TRUE(completes(b.workspace->push(kiv::PushMode::MergeFirst)));
  b.workspace->updateContext();
  EXPECT_TRUE(b.tip()->isMerge());

  ASSERT_TRUE(completes(a.workspace->pull()));
  EXPECT_EQ(a.tip().getUuid(), b.tip().getUuid());
  EXPECT_EQ(stateOf(a.user), stateOf(b.user));
  EXPECT_EQ(stateOf(a.user).size(), 3u);
  EXPECT_TRUE(a.repository->isEquivalent(served));
  EXPECT_TRUE(b.repository->isEquivalent(served));
  EXPECT_EQ(server->connectionCount(), 2u);
}

TEST_F(OverTheNetwork, IdleConnectionsAreClosedButObserversStay) {
  RemoteClone idle = cloneServed();
  RemoteClone observer = cloneServed();
  observer.repository->startObservingOrigin();
  EXPECT_EQ(server->closeIdle(std::chrono::hours(1)), 0u);
  EXPECT_EQ(server->closeIdle(std::chrono::milliseconds(0)), 1u);
  EXPECT_EQ(server->connectionCount(), 1u);
  EXPECT_EQ(server->observerCount(), 1u);
  // Closed from the server's side: the exchange fails ("ExchangeFailed" or "ChannelClosed",
  // depending on whether the client heard of the close before sending).
  EXPECT_THROW(idle.origin->pullRepoInfo(), foundation::core::except::ExceptionBase);
  EXPECT_NO_THROW(observer.origin->pullRepoInfo());
  observer.repository->stopObservingOrigin();
}

TEST_F(OverTheNetwork, RepoInfoTellsBarenessAndHead) {
  RemoteClone a = cloneServed();
  const kiv::protocol::RepoInfo info = a.origin->pullRepoInfo();
  EXPECT_TRUE(info.getIsBare());
  EXPECT_EQ(info.getHead(), u"master");
}

// A history made against a state the server has left behind is refused by the server,
// and the pushing user hears "CannotPush" as in process.
TEST_F(OverTheNetwork, AStalePushIsRefusedAsCannotPushAndChangesNothing) {
  RemoteClone a = cloneServed();
  RemoteClone b = cloneServed();
  addNode(b, u"b");
  ASSERT_TRUE(completes(b.workspace->push(kiv::PushMode::TryPush)));
  addNode(a, u"a");
  kiv::protocol::History stale;
  {
    qf::zero::Transaction transaction = a.repositories->beginTransaction();
    stale = kiv::protocol::History::create(a.repositories);
    stale->getPreviousMutable().add(a.origin->getBranches().container().at(u"master"));
    stale->getCurrentMutable().add(a.repository->getHead());
    transaction.commit();
  }
  const std::string before = servedDump();
  EXPECT_TRUE(raises([&] { a.origin->pushObjects(stale); }, kiv::messages::CannotPush()));
  EXPECT_EQ(servedDump(), before);
}

TEST_F(OverTheNetwork, AnObserverIsToldOfAnotherClientsPushAndPullsWhenItChooses) {
  RemoteClone a = cloneServed();
  RemoteClone b = cloneServed();
  auto notices = std::make_shared<kiv::QueuedNoticeExecutor>();
  kiv::setNoticeExecutor(a.repository, notices);
  a.repository->startObservingOrigin();
  EXPECT_EQ(server->observerCount(), 1u);

  addNode(b, u"b");
  ASSERT_TRUE(completes(b.workspace->push(kiv::PushMode::TryPush)));
  ASSERT_TRUE(notices->waitForWork(std::chrono::seconds(30))) << "no change notice arrived";
  EXPECT_EQ(notices->runPending(), 1u);
  a.workspace->updateContext();
  EXPECT_EQ(stateOf(a.user), stateOf(b.user));

  a.repository->stopObservingOrigin();
  EXPECT_EQ(server->observerCount(), 0u);
  EXPECT_EQ(served->getNumRemoteObservers(), 0);
}

// Four clients on their own threads, over WebSocket on loopback, edit, push with
// "MergeFirst" and pull in turns of their own choosing; a push that loses a race to
// another is refused and tried again.
TEST_F(OverTheNetwork, FourClientsConvergeOnOneServer) {
  constexpr int clients = 4;
  constexpr int rounds = 6;
  std::vector<RemoteClone> clones;
  for (int i = 0; i < clients; ++i) clones.push_back(cloneServed(true));
  std::vector<std::future<void>> workers;
  for (int i = 0; i < clients; ++i) {
    workers.push_back(std::async(std::launch::async, [this, &clone = clones[i], i] {
      for (int round = 0; round < rounds; ++round) {
        addNode(clone, u"client " + qf::zero::toUtf16(std::to_string(i)) + u" round " +
                           qf::zero::toUtf16(std::to_string(round)));
        bool pushed = false;
        for (int attempt = 0; attempt < 50 && !pushed; ++attempt) {
          std::future<void> push = clone.workspace->push(kiv::PushMode::MergeFirst);
          if (!finishes(push)) throw std::runtime_error("a push hangs");
          try {
            push.get();
            pushed = true;
          } catch (const Exception<kiv::messages::CannotPush>&) {
            // another client pushed between this one's look at the server and its push
          }
          clone.workspace->updateContext();
        }
        if (!pushed) throw std::runtime_error("a push never got through");
        std::future<void> pull = clone.workspace->pull();
        if (!finishes(pull)) throw std::runtime_error("a pull hangs");
        pull.get();
      }
    }));
  }
  for (std::future<void>& worker : workers) {
    ASSERT_TRUE(finishes(worker));
    worker.get();
  }
  for (RemoteClone& clone : clones) ASSERT_TRUE(completes(clone.workspace->pull()));
  for (RemoteClone& clone : clones) {
    EXPECT_TRUE(clone.repository->isEquivalent(served));
    EXPECT_EQ(stateOf(clone.user), stateOf(clones.front().user));
  }
  EXPECT_EQ(stateOf(clones.front().user).size(), static_cast<std::size_t>(clients * rounds));
}

// Without a server: the served repository answers on its own transport, the one peer
// at its other end, and tells it of changes while it observes.
TEST_F(OverTheNetwork, ALocalRepositoryServesThePeerOnItsOwnTransport) {
  const Model ownModel = Model::create();
  const Model ownUser = Model::create();
  const kiv::LocalRepository alone = kiv::LocalRepository::create(ownModel, ownUser);
  alone->init(kiv::RepoType::Bare);
  auto [mine, theirs] = InProcessChannel::createPair();
  alone->setSynchronizationChannel(theirs);

  RemoteClone peer;
  {
    qf::zero::Transaction transaction = peer.repositories->beginTransaction();
    peer.origin = kiv::RemoteRepository::create(peer.repositories);
    transaction.commit();
  }
  peer.origin->setSynchronizationChannel(mine);
  peer.repository = peer.origin->synchronousClone(kiv::RepoType::Regular);
  peer.workspace = peer.repository->getWorkspace(peer.user);
  auto notices = std::make_shared<kiv::QueuedNoticeExecutor>();
  kiv::setNoticeExecutor(peer.repository, notices);
  peer.repository->startObservingOrigin();
  EXPECT_EQ(alone->getNumRemoteObservers(), 1);

  addNode(peer, u"p");
  ASSERT_TRUE(completes(peer.workspace->push(kiv::PushMode::TryPush)));
  EXPECT_EQ(alone->getHead()->getTip().getUuid(), peer.tip().getUuid());
  ASSERT_TRUE(notices->waitForWork(std::chrono::seconds(30))) << "the change was not told";
  notices->runPending();
  EXPECT_TRUE(peer.repository->isEquivalent(alone));

  peer.repository->stopObservingOrigin();
  EXPECT_EQ(alone->getNumRemoteObservers(), 0);
}

// A request over the server's packet limit ends that connection; nothing is read from it,
// and the server goes on serving others.
TEST_F(OverTheNetwork, ARequestOverThePacketLimitEndsOnlyItsConnection) {
  auto [mine, theirs] = InProcessChannel::createPair();
  theirs->setMaxMessageSize(4096);
  server->addConnection(theirs);
  PacketTransport peer(mine);
  const std::string before = servedDump();
  EXPECT_THROW(
      peer.sendAndExpectPacket(JSONPacket("Push", std::string(8192, 'x')), "OK", std::chrono::seconds(30)),
      Exception<qf0::messages::ExchangeFailed>);
  EXPECT_EQ(servedDump(), before);
  RemoteClone other = cloneServed();
  addNode(other, u"still served");
  EXPECT_TRUE(completes(other.workspace->push(kiv::PushMode::TryPush)));
}

// A server that answers badly: the client gets a clear error and its repository model is
// as it was.
struct BadReply {
  std::string name;
  std::string request;  // the request type the fake server answers badly
  JSONPacket reply;
  std::function<void(const kiv::RemoteRepository&)> ask;
  std::string raisedKey;  // the key of the catalog error the client raises
};

class BadServer : public ::testing::TestWithParam<BadReply> {};

TEST_P(BadServer, ClientRaisesAndKeepsItsModel) {
  const BadReply& row = GetParam();
  kiv::MetaPackageKiv::getInstance();
  auto [mine, theirs] = InProcessChannel::createPair();
  PacketTransport fake(theirs);
  fake.setPacketHandler(row.request,
                        [&](const JSONPacket&) -> boost::optional<JSONPacket> { return row.reply; });
  const Model repositories = Model::create();
  kiv::RemoteRepository remote;
  {
    qf::zero::Transaction transaction = repositories->beginTransaction();
    remote = kiv::RemoteRepository::create(repositories);
    transaction.commit();
  }
  remote->setSynchronizationChannel(mine);
  const std::string before = dumpOf(repositories);
  try {
    row.ask(remote);
    ADD_FAILURE() << "raised nothing";
  } catch (const foundation::core::except::ExceptionBase& raised) {
    EXPECT_EQ(raised.GetBaseMsgIDObj().key(), row.raisedKey) << raised.message();
  }
  EXPECT_EQ(dumpOf(repositories), before);
}

const auto pullInfo = [](const kiv::RemoteRepository& remote) { remote->pullRepoInfo(); };
const auto pullObjects = [](const kiv::RemoteRepository& remote) { remote->pullObjects(); };
const std::vector<BadReply> badReplies = {
    {"RepoInfoWithoutHead", "PullInfo", JSONPacket("RepoInfo", {{"isBare", true}}), pullInfo,
     "MalformedPacket"},
    {"RepoInfoOfWrongTypes", "PullInfo", JSONPacket("RepoInfo", {{"isBare", "yes"}, {"head", 1}}), pullInfo,
     "MalformedPacket"},
    {"AnotherReplyType", "PullInfo", JSONPacket("History", nullptr), pullInfo, "UnexpectedPacket"},
    {"AnError", "Pull", JSONPacket("Error", {{"message", "no"}}), pullObjects, "UnexpectedPacket"},
    {"HistoryNotADocument", "Pull", JSONPacket("History", "nonsense"), pullObjects, "MalformedDocument"},
    {"HistoryWithoutAHistory", "Pull",
     JSONPacket("History", {{"version", "1.0"}, {"entries", JsonValue::array()}}), pullObjects,
     "MalformedHistory"},
    {"HistoryWithAStorageOfNoEntry", "Pull",
     JSONPacket(
         "History",
         {{"version", "1.0"},
          {"entries",
           JsonValue::array(
               {{{"type", "kiv.ObjectStorage"},
                 {"id", "0b2c5a9e-3f1d-4c2b-9a8e-7d6c5b4a3f21"},
                 {"content", {{"elementUUID", "5d0f7a4e-1c2b-4e3d-8f9a-0b1c2d3e4f50"}, {"content", 5}}}}})}}),
     pullObjects, "MalformedHistory"},
};

using repository_test::PrintTo;
INSTANTIATE_TEST_SUITE_P(Replies, BadServer, ::testing::ValuesIn(badReplies), CaseName());

}  // namespace
}  // namespace repository_test
