// Repositories over a packet transport: a bare repository served to clients that reach it
// through remote proxies, over in-process channels.
#include "kiv/metamodel/protocol/history_impl.h"
#include "kiv/metamodel/remote_repository_impl.h"
#include "kiv/protocol/repository_server.h"
#include "kiv/repository/packet_answers.h"
#include "kiv/repository/repository_fixture.h"
#include "qf/zero/io/in_process_channel.h"
#include "qf/zero/io/packet_transport.h"
#include "qf/zero/io/websocket_channel.h"

#include <functional>

namespace repository_test {
namespace {

using kiv::protocol::RepositoryServer;
using qf::zero::io::InProcessChannel;
using qf::zero::io::JSONPacket;
using qf::zero::io::PacketTransport;

// A client: its own repository model holding the origin's proxy and its clone, and a
// user model bound to the clone's workspace.
struct RemoteClone {
  Model repositories = Model::create();
  Model user = Model::create();
  kiv::RemoteRepository origin;
  kiv::LocalRepository repository;
  kiv::Workspace workspace;

  kiv::Commit tip() const { return repository->getHead()->getTip(); }
};

class OverTheNetwork : public ::testing::Test {
 protected:
  OverTheNetwork() {
    kiv::MetaPackageKiv::getInstance();
    served = kiv::LocalRepository::create(serverModel, serverUser);
    served->init(kiv::RepoType::Bare);
    server = std::make_unique<RepositoryServer>(served);
  }

  std::shared_ptr<qf::zero::io::SynchronizationChannel> connectToServer() {
    auto [mine, theirs] = InProcessChannel::createPair();
    server->addConnection(theirs);
    return mine;
  }

  // A WebSocket connection to the server over loopback, through a listener made on first use.
  std::shared_ptr<qf::zero::io::SynchronizationChannel> connectOverLoopback() {
    if (!listener) {
      listener = std::make_unique<qf::zero::io::WebSocketListener>(
          "127.0.0.1", 0, [this](std::shared_ptr<qf::zero::io::SynchronizationChannel> channel) {
            server->addConnection(std::move(channel));
          });
    }
    return qf::zero::io::WebSocketChannel::connect("127.0.0.1", listener->getPort());
  }

  RemoteClone cloneServed(bool overLoopback = false) {
    RemoteClone clone;
    {
      qf::zero::Transaction transaction = clone.repositories->beginTransaction();
      clone.origin = kiv::RemoteRepository::create(clone.repositories);
      transaction.commit();
    }
    clone.origin->setSynchronizationChannel(overLoopback ? connectOverLoopback() : connectToServer());
    clone.repository = clone.origin->synchronousClone(kiv::RepoType::Regular);
    clone.workspace = clone.repository->getWorkspace(clone.user);
    kiv::loadContext(clone.workspace);
    return clone;
  }

  ModelElement addNode(RemoteClone& clone, const std::u16string& name) { return addNodeTo(tm, clone, name); }

  // What the served repository holds, read while no request is in flight.
  std::string servedDump() const { return dumpOf(serverModel); }

  support::TestMetamodel tm;
  Model serverModel = Model::create();
  Model serverUser = Model::create();
  kiv::LocalRepository served;
  std::unique_ptr<RepositoryServer> server;
  std::unique_ptr<qf::zero::io::WebSocketListener> listener;  // closed before the server goes
};

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
};

using repository_test::PrintTo;
INSTANTIATE_TEST_SUITE_P(Replies, BadServer, ::testing::ValuesIn(badReplies), CaseName());

// A peer that speaks the protocol badly: every request is answered, nothing changes,
// and the server goes on serving others.
struct HostileRequest {
  std::string name;
  std::string type;
  std::function<void(JsonValue&)> spoil;  // applied to a well-formed push of two commits
  std::string messageId;                  // of the "Error" reply: "catalog/key"
};

class HostilePeer : public OverTheNetwork, public ::testing::WithParamInterface<HostileRequest> {};

// The entry of `document` whose type is `type`, the first one.
JsonValue& entryOfType(JsonValue& document, const std::string& type) {
  for (JsonValue& entry : document["entries"]) {
    if (entry["type"] == type) return entry;
  }
  throw std::runtime_error("no entry of type " + type);
}

TEST_P(HostilePeer, GetsAnErrorAndTheServerKeepsServing) {
  const HostileRequest& row = GetParam();
  RemoteClone a = cloneServed();
  addNode(a, u"one");
  addNode(a, u"two");
  kiv::protocol::History push;
  {
    qf::zero::Transaction transaction = a.repositories->beginTransaction();
    push = kiv::protocol::History::create(a.repositories);
    push->getPreviousMutable().add(a.origin->getBranches().container().at(u"master"));
    push->getCurrentMutable().add(a.repository->getHead());
    transaction.commit();
  }
  JsonValue body = push.pack();
  row.spoil(body);

  PacketTransport peer(connectToServer());
  const std::string before = servedDump();
  const JSONPacket reply =
      peer.sendAndExpectPacket(JSONPacket(row.type, body), "OK", std::chrono::seconds(30));
  EXPECT_EQ(reply.getType(), "Error") << reply.getJson().dump();
  EXPECT_EQ(reply.getJson().value("messageId", ""), row.messageId) << reply.getJson().dump();
  EXPECT_EQ(servedDump(), before);

  RemoteClone b = cloneServed();
  addNode(b, u"b");
  EXPECT_TRUE(completes(b.workspace->push(kiv::PushMode::TryPush))) << "the server still takes pushes";
}

const std::string push = "Push";
const std::vector<HostileRequest> hostileRequests = {
    {"NotADocument", push,
     [](JsonValue& body) {
       body = JsonValue::array({1, 2});
     },
     "qf0:messages/MalformedDocument"},
    {"EntriesNotAnArray", push, [](JsonValue& body) { body["entries"] = "none"; },
     "qf0:messages/MalformedDocument"},
    {"UnknownElementType", push,
     [](JsonValue& body) { entryOfType(body, "kiv.Commit")["type"] = "kiv.Nothing"; },
     "qf0:messages/NoSuchClass"},
    {"ForeignElementType", push,
     [](JsonValue& body) { entryOfType(body, "kiv.Commit")["type"] = "kiv.LocalRepository"; },
     "kiv:messages/MalformedHistory"},
    {"ElementIdTwice", push,
     [](JsonValue& body) { body["entries"].push_back(entryOfType(body, "kiv.ObjectStorage")); },
     "qf0:messages/DuplicateElementId"},
    {"WrongJsonType", push,
     [](JsonValue& body) { entryOfType(body, "kiv.Commit")["content"]["parents"] = 7; },
     "qf0:messages/WrongJsonType"},
    {"ParentNeitherCarriedNorKnown", push,
     [](JsonValue& body) {
       entryOfType(body, "kiv.Commit")["content"]["parents"] =
           JsonValue::array({"0b2c5a9e-3f1d-4c2b-9a8e-7d6c5b4a3f21"});
     },
     "qf0:messages/DanglingReference"},
    {"DeltaNotCarried", push,
     [](JsonValue& body) {
       auto& entries = body["entries"];
       for (auto it = entries.begin(); it != entries.end(); ++it) {
         if ((*it)["type"] == "kiv.Delta") {
           entries.erase(it);
           return;
         }
       }
     },
     "qf0:messages/DanglingReference"},
    {"CyclicParents", push,
     [](JsonValue& body) {
       std::vector<JsonValue*> commits;
       for (JsonValue& entry : body["entries"]) {
         if (entry["type"] == "kiv.Commit") commits.push_back(&entry);
       }
       ASSERT_GE(commits.size(), 2u);
       (*commits[0])["content"]["parents"] = JsonValue::array({(*commits[1])["id"]});
       (*commits[1])["content"]["parents"] = JsonValue::array({(*commits[0])["id"]});
     },
     "kiv:messages/MalformedHistory"},
    {"PullWithNonsense", "Pull", [](JsonValue& body) { body = "nonsense"; },
     "qf0:messages/MalformedDocument"},
};

using repository_test::PrintTo;
INSTANTIATE_TEST_SUITE_P(Requests, HostilePeer, ::testing::ValuesIn(hostileRequests), CaseName());

}  // namespace
}  // namespace repository_test
