// Hostile peers: every request type with every kind of bad body. Each request is answered
// (or, over the packet limit, its connection ended), the served repository stays
// byte-identical, and other clients are still served.
#include "kiv/protocol/network_fixture.h"
#include "qf/zero/io/packet_codec.h"

#include <condition_variable>
#include <deque>
#include <map>
#include <mutex>
#include <optional>
#include <tuple>

namespace repository_test {
namespace {

using qf::zero::io::PacketCodec;

// A peer that writes packet texts as it likes and reads what comes back.
class RawPeer {
 public:
  explicit RawPeer(std::shared_ptr<qf::zero::io::SynchronizationChannel> channel)
      : channel_(std::move(channel)) {
    channel_->start(
        [this](std::string message) {
          const std::lock_guard<std::mutex> lock(mutex_);
          received_.push_back(std::move(message));
          changed_.notify_all();
        },
        [this](const std::string&) {
          const std::lock_guard<std::mutex> lock(mutex_);
          closed_ = true;
          changed_.notify_all();
        });
  }
  RawPeer(const RawPeer&) = delete;
  RawPeer& operator=(const RawPeer&) = delete;
  ~RawPeer() { channel_->close(); }

  // The first text that comes back, or nullopt when the connection ends without one.
  std::optional<std::string> ask(std::string text) {
    channel_->send(std::move(text));
    std::unique_lock<std::mutex> lock(mutex_);
    if (!changed_.wait_for(lock, std::chrono::seconds(30), [&] { return !received_.empty() || closed_; })) {
      ADD_FAILURE() << "neither answered nor closed within 30 s";
    }
    if (received_.empty()) return std::nullopt;
    return received_.front();
  }

 private:
  std::shared_ptr<qf::zero::io::SynchronizationChannel> channel_;
  std::mutex mutex_;
  std::condition_variable changed_;
  std::deque<std::string> received_;
  bool closed_ = false;
};

const std::vector<std::string> requestTypes = {"PullInfo", "Pull", "Push", "AddRemoteObserver",
                                               "RemoveRemoteObserver"};
constexpr std::size_t packetLimit = 64 * 1024;

// What the peer gets back: "Error <messageId>", "CannotPush", "History", or "closed".
using Outcome = std::string;
const Outcome malformedPacket = "Error qf0:messages/MalformedPacket";

// Well-formed request bodies: the asker's branch states, and a push of two commits.
struct Bodies {
  JsonValue pull;
  JsonValue push;

  // The one a request of `type` carries: a pull its branch states, any other a push.
  const JsonValue& of(const std::string& type) const { return type == "Pull" ? pull : push; }
};

using TextWriter = std::function<std::string(const std::string& type, const Bodies& bodies)>;

struct HostileBody {
  std::string name;
  TextWriter text;  // of a request of `type`
  // By request type; a type not named gets "MalformedPacket" (a request that carries
  // nothing was sent a body).
  std::map<std::string, Outcome> outcomes;
  bool staleFirst = false;  // another client pushes before the request is sent
};

std::string packetText(const std::string& type, const JsonValue& body) {
  return PacketCodec::encode(JSONPacket(type, body), 1);
}

// Applies `spoil` to the body a request of its type carries, then writes the packet.
TextWriter spoiled(std::function<void(JsonValue&)> spoil) {
  return [spoil = std::move(spoil)](const std::string& type, const Bodies& bodies) {
    JsonValue body = bodies.of(type);
    spoil(body);
    return packetText(type, body);
  };
}

// The same with the push's body for every type: the spoil is of commits, deltas or storages.
TextWriter spoiledPush(std::function<void(JsonValue&)> spoil) {
  return [spoil = std::move(spoil)](const std::string& type, const Bodies& bodies) {
    JsonValue body = bodies.push;
    spoil(body);
    return packetText(type, body);
  };
}

// The entries of `document` whose type is `type`.
std::vector<JsonValue*> entriesOfType(JsonValue& document, const std::string& type) {
  std::vector<JsonValue*> found;
  for (JsonValue& entry : document["entries"]) {
    if (entry["type"] == type) found.push_back(&entry);
  }
  return found;
}

JsonValue& entryOfType(JsonValue& document, const std::string& type) {
  const std::vector<JsonValue*> found = entriesOfType(document, type);
  if (found.empty()) throw std::runtime_error("no entry of type " + type);
  return *found.front();
}

void eraseFirstOfType(JsonValue& document, const std::string& type) {
  JsonValue& entries = document["entries"];
  for (auto it = entries.begin(); it != entries.end(); ++it) {
    if ((*it)["type"] == type) {
      entries.erase(it);
      return;
    }
  }
}

std::string errorOf(const std::string& key) { return "Error " + key; }

const std::vector<HostileBody> hostileBodies = {
    {"MalformedJson",
     [](const std::string& type, const Bodies& bodies) {
       const std::string whole = packetText(type, bodies.of(type));
       return whole.substr(0, whole.size() / 2);
     },
     {}},
    {"NotADocument",
     spoiled([](JsonValue& body) {
       body = JsonValue::array({1, 2});
     }),
     {{"Pull", errorOf("qf0:messages/MalformedDocument")},
      {"Push", errorOf("qf0:messages/MalformedDocument")}}},
    {"WrongJsonTypes",
     spoiled([](JsonValue& body) {
       if (entriesOfType(body, "kiv.Commit").empty()) {
         entryOfType(body, "kiv.Branch")["content"]["name"] = 7;
       } else {
         entryOfType(body, "kiv.Commit")["content"]["parents"] = 7;
       }
     }),
     {{"Pull", errorOf("qf0:messages/WrongJsonType")}, {"Push", errorOf("qf0:messages/WrongJsonType")}}},
    {"OverThePacketLimit",
     spoiled([](JsonValue& body) { body = std::string(2 * packetLimit, 'x'); }),
     {{"PullInfo", "closed"},
      {"Pull", "closed"},
      {"Push", "closed"},
      {"AddRemoteObserver", "closed"},
      {"RemoveRemoteObserver", "closed"}}},
    // A pull names branch states only: the rows that spoil commits, deltas or storages send
    // it a push's body, which it refuses for what it carries.
    {"DeltaNotCarried",
     spoiledPush([](JsonValue& body) { eraseFirstOfType(body, "kiv.Delta"); }),
     {{"Pull", errorOf("kiv:messages/MalformedHistory")},
      {"Push", errorOf("qf0:messages/DanglingReference")}}},
    {"StorageNotCarried",
     spoiledPush([](JsonValue& body) { eraseFirstOfType(body, "kiv.ObjectStorage"); }),
     {{"Pull", errorOf("kiv:messages/MalformedHistory")},
      {"Push", errorOf("qf0:messages/DanglingReference")}}},
    {"ParentNeitherCarriedNorKnown",
     spoiledPush([](JsonValue& body) {
       entryOfType(body, "kiv.Commit")["content"]["parents"] =
           JsonValue::array({"0b2c5a9e-3f1d-4c2b-9a8e-7d6c5b4a3f21"});
     }),
     {{"Pull", errorOf("kiv:messages/MalformedHistory")},
      {"Push", errorOf("qf0:messages/DanglingReference")}}},
    {"CyclicParents",
     spoiledPush([](JsonValue& body) {
       const std::vector<JsonValue*> commits = entriesOfType(body, "kiv.Commit");
       (*commits.at(0))["content"]["parents"] = JsonValue::array({(*commits.at(1))["id"]});
       (*commits.at(1))["content"]["parents"] = JsonValue::array({(*commits.at(0))["id"]});
     }),
     {{"Pull", errorOf("kiv:messages/MalformedHistory")},
      {"Push", errorOf("kiv:messages/MalformedHistory")}}},
    {"ElementIdTwice",
     spoiled([](JsonValue& body) {
       const std::string type =
           entriesOfType(body, "kiv.Commit").empty() ? "kiv.Branch" : "kiv.ObjectStorage";
       body["entries"].push_back(entryOfType(body, type));
     }),
     {{"Pull", errorOf("qf0:messages/DuplicateElementId")},
      {"Push", errorOf("qf0:messages/DuplicateElementId")}}},
    {"UnknownElementType",
     spoiled([](JsonValue& body) {
       const std::string type = entriesOfType(body, "kiv.Commit").empty() ? "kiv.Branch" : "kiv.Commit";
       entryOfType(body, type)["type"] = "kiv.Nothing";
     }),
     {{"Pull", errorOf("kiv:messages/MalformedHistory")}, {"Push", errorOf("qf0:messages/NoSuchClass")}}},
    {"ForeignElementType",
     spoiled([](JsonValue& body) {
       const std::string type = entriesOfType(body, "kiv.Commit").empty() ? "kiv.Branch" : "kiv.Commit";
       entryOfType(body, type)["type"] = "kiv.LocalRepository";
     }),
     {{"Pull", errorOf("kiv:messages/MalformedHistory")},
      {"Push", errorOf("kiv:messages/MalformedHistory")}}},
    {"StorageContentNotAnEntry",
     spoiledPush([](JsonValue& body) {
       for (JsonValue* storage : entriesOfType(body, "kiv.ObjectStorage")) {
         (*storage)["content"]["content"] = JsonValue{{"type", "test.Node"}, {"content", "not an object"}};
       }
     }),
     {{"Pull", errorOf("kiv:messages/MalformedHistory")},
      {"Push", errorOf("kiv:messages/MalformedHistory")}}},
    {"StorageOfAnotherElement",
     spoiledPush([](JsonValue& body) {
       for (JsonValue* storage : entriesOfType(body, "kiv.ObjectStorage")) {
         (*storage)["content"]["content"]["id"] = "0b2c5a9e-3f1d-4c2b-9a8e-7d6c5b4a3f21";
       }
     }),
     {{"Pull", errorOf("kiv:messages/MalformedHistory")},
      {"Push", errorOf("kiv:messages/MalformedHistory")}}},
    // Not hostile for a pull: a stale state is what a pull is for.
    {"StaleState",
     [](const std::string& type, const Bodies& bodies) { return packetText(type, bodies.of(type)); },
     {{"Pull", "History"}, {"Push", "CannotPush"}},
     /*staleFirst=*/true},
};

class HostilePeer : public OverTheNetwork,
                    public ::testing::WithParamInterface<std::tuple<std::string, HostileBody>> {
 protected:
  // The bodies `client` would send: its state of the origin's master as both states for a
  // pull, its own master against it for a push.
  static Bodies wellFormedBodies(const RemoteClone& client) {
    const auto body = [&](bool pushing) {
      qf::zero::Transaction transaction = client.repositories->beginTransaction();
      const kiv::protocol::History history = kiv::protocol::History::create(client.repositories);
      const kiv::Branch known = client.origin->getBranches().container().at(u"master");
      history->getPreviousMutable().add(known);
      history->getCurrentMutable().add(pushing ? client.repository->getHead() : known);
      transaction.commit();
      return history.pack();
    };
    return Bodies{body(false), body(true)};
  }

  static Outcome outcomeOf(const std::optional<std::string>& answer) {
    if (!answer) return "closed";
    const qf::zero::io::PacketEnvelope envelope = PacketCodec::decode(*answer);
    if (envelope.packet.getType() != "Error") return envelope.packet.getType();
    return "Error " + envelope.packet.getJson().value("messageId", std::string("(none)"));
  }
};

TEST_P(HostilePeer, IsAnsweredAndNothingChangesAndOthersAreStillServed) {
  const auto& [type, row] = GetParam();
  RemoteClone a = cloneServed();
  addNode(a, u"one");
  addNode(a, u"two");
  if (row.staleFirst) {
    RemoteClone first = cloneServed();
    addNode(first, u"first");
    ASSERT_TRUE(completes(first.workspace->push(kiv::PushMode::TryPush)));
  }
  const std::string text = row.text(type, wellFormedBodies(a));

  auto [mine, theirs] = InProcessChannel::createPair();
  theirs->setMaxMessageSize(packetLimit);
  server->addConnection(theirs);
  const std::string before = servedDump();
  {
    RawPeer peer(mine);
    const auto expected = row.outcomes.find(type);
    EXPECT_EQ(outcomeOf(peer.ask(text)), expected == row.outcomes.end() ? malformedPacket : expected->second);
  }
  EXPECT_EQ(servedDump(), before);
  EXPECT_EQ(served->getNumRemoteObservers(), 0);

  RemoteClone b = cloneServed();
  addNode(b, u"b");
  EXPECT_TRUE(completes(b.workspace->push(kiv::PushMode::MergeFirst))) << "the server still takes pushes";
}

using repository_test::PrintTo;

std::string cellName(const ::testing::TestParamInfo<std::tuple<std::string, HostileBody>>& info) {
  return std::get<0>(info.param) + "_" + std::get<1>(info.param).name;
}

INSTANTIATE_TEST_SUITE_P(Requests, HostilePeer,
                         ::testing::Combine(::testing::ValuesIn(requestTypes),
                                            ::testing::ValuesIn(hostileBodies)),
                         cellName);

}  // namespace
}  // namespace repository_test
