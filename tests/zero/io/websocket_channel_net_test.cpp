#include "qf/zero/io/websocket_channel.h"
#include "support/channel_test_cases.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <arpa/inet.h>
#include <netinet/in.h>
#include <sys/socket.h>
#include <unistd.h>

#include <chrono>
#include <cstdint>
#include <filesystem>
#include <future>
#include <memory>
#include <string>
#include <thread>
#include <vector>

namespace support {

namespace {

using qf::zero::io::WebSocketChannel;
using qf::zero::io::WebSocketListener;
using ConnectionFailed = Raised<qf0::messages::ConnectionFailed>;
using ListenFailed = Raised<qf0::messages::ListenFailed>;

// Accepted channels, handed over one at a time.
class AcceptedChannels {
 public:
  WebSocketListener::AcceptHandler handler() {
    return [this](std::shared_ptr<SynchronizationChannel> channel) {
      std::lock_guard lock(mutex_);
      accepted_.push_back(std::move(channel));
      changed_.notify_all();
    };
  }

  std::shared_ptr<SynchronizationChannel> next() {
    std::unique_lock lock(mutex_);
    changed_.wait_for(lock, patience, [&] { return !accepted_.empty(); });
    if (accepted_.empty()) return nullptr;
    auto channel = std::move(accepted_.front());
    accepted_.pop_front();
    return channel;
  }

  std::size_t waiting() {
    std::lock_guard lock(mutex_);
    return accepted_.size();
  }

 private:
  std::mutex mutex_;
  std::condition_variable changed_;
  std::deque<std::shared_ptr<SynchronizationChannel>> accepted_;
};

ChannelKind webSocketChannels() {
  return {"WebSocket", [] {
            AcceptedChannels accepted;
            WebSocketListener listener("127.0.0.1", 0, accepted.handler());
            auto client = WebSocketChannel::connect("127.0.0.1", listener.getPort());
            auto server = accepted.next();
            if (!server) throw std::runtime_error("the listener accepted nothing");
            return ChannelPair{client, server};  // both outlive the listener
          }};
}

// A TCP peer that speaks no WebSocket unless told to, for what a proper client never does.
class RawPeer {
 public:
  explicit RawPeer(std::uint16_t port) : fd_(::socket(AF_INET, SOCK_STREAM, 0)) {
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_port = htons(port);
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    if (fd_ < 0 || ::connect(fd_, reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0)
      throw std::runtime_error("cannot connect the raw peer");
  }
  ~RawPeer() { drop(); }

  void write(const std::string& bytes) {
    if (::send(fd_, bytes.data(), bytes.size(), MSG_NOSIGNAL) != static_cast<ssize_t>(bytes.size()))
      throw std::runtime_error("the raw peer cannot write");
  }

  // Sends an opening handshake and returns the status line of the answer.
  std::string handshake() {
    write(
        "GET / HTTP/1.1\r\nHost: 127.0.0.1\r\nUpgrade: websocket\r\nConnection: Upgrade\r\n"
        "Sec-WebSocket-Key: dGhlIHNhbXBsZSBub25jZQ==\r\nSec-WebSocket-Version: 13\r\n\r\n");
    std::string answer;
    char c = 0;
    while (answer.find("\r\n\r\n") == std::string::npos && ::recv(fd_, &c, 1, 0) == 1) answer += c;
    return answer.substr(0, answer.find("\r\n"));
  }

  // Everything until the other side closes the connection.
  std::string readUntilClosed() {
    std::string all;
    char buffer[256];
    for (ssize_t n; (n = ::recv(fd_, buffer, sizeof buffer, 0)) > 0;)
      all.append(buffer, static_cast<std::size_t>(n));
    return all;
  }

  // Vanishes without a closing handshake.
  void drop() {
    if (fd_ >= 0) ::close(fd_);
    fd_ = -1;
  }

 private:
  int fd_;
};

}  // namespace

INSTANTIATE_TEST_SUITE_P(WebSocket, ChannelContract, testing::Values(webSocketChannels()), kindName);
INSTANTIATE_TEST_SUITE_P(WebSocket, PacketExchange, testing::Values(webSocketChannels()), kindName);

TEST(WebSocketChannel, ConnectingWhereNobodyListensOrListeningWhereSomeoneDoesFails) {
  std::uint16_t freePort = 0;
  {
    AcceptedChannels accepted;
    WebSocketListener listener("127.0.0.1", 0, accepted.handler());
    freePort = listener.getPort();
    EXPECT_THROW(WebSocketChannel::connect("127.0.0.1", freePort, "no-slash"), ConnectionFailed);
    EXPECT_THROW(WebSocketListener("127.0.0.1", freePort, accepted.handler()), ListenFailed);
  }
  try {
    WebSocketChannel::connect("127.0.0.1", freePort);
    ADD_FAILURE() << "connected to a closed port";
  } catch (const ConnectionFailed& error) {
    EXPECT_THAT(error.what(), testing::HasSubstr("127.0.0.1:" + std::to_string(freePort)));
  }
}

TEST(WebSocketChannel, APeerThatVanishesWithoutClosingHandshakeClosesTheOtherEnd) {
  AcceptedChannels accepted;
  WebSocketListener listener("127.0.0.1", 0, accepted.handler());
  RawPeer peer(listener.getPort());
  EXPECT_EQ(peer.handshake(), "HTTP/1.1 101 Switching Protocols");
  auto channel = accepted.next();
  ASSERT_TRUE(channel);
  auto inbox = Inbox::startOn(*channel);

  peer.drop();
  EXPECT_THAT(inbox->closedReason().value_or("none"), testing::StartsWith("connection lost"));
  EXPECT_THROW(channel->send("anyone?"), Raised<qf0::messages::ChannelClosed>);
}

TEST(WebSocketListener, PeersThatFailOrStallTheHandshakeAreDroppedUnseen) {
  AcceptedChannels accepted;
  auto listener = std::make_unique<WebSocketListener>("127.0.0.1", 0, accepted.handler());
  {
    RawPeer garbage(listener->getPort());
    garbage.write("HELLO\r\n\r\n");
    EXPECT_THAT(garbage.readUntilClosed(), testing::Not(testing::HasSubstr("101")));
  }
  RawPeer stalled(listener->getPort());  // connects and never speaks
  auto channel = WebSocketChannel::connect("127.0.0.1", listener->getPort());
  auto server = accepted.next();
  ASSERT_TRUE(server);
  EXPECT_EQ(accepted.waiting(), 0u);

  // Closing the listener drops the stalled peer without waiting for its handshake timeout,
  // and leaves the accepted channel open.
  const auto started = std::chrono::steady_clock::now();
  listener.reset();
  EXPECT_LT(std::chrono::steady_clock::now() - started, std::chrono::seconds(5));
  auto inbox = Inbox::startOn(*server);
  channel->send("still open");
  EXPECT_EQ(inbox->next(), "still open");
}

TEST(WebSocketListener, AListenerWithATargetServesOnlyPeersThatAskForIt) {
  AcceptedChannels accepted;
  WebSocketListener listener("127.0.0.1", 0, accepted.handler(), "/s3cret");
  // A refused client learns it from the answer, without waiting out the opening timeout.
  const auto started = std::chrono::steady_clock::now();
  EXPECT_THROW(WebSocketChannel::connect("127.0.0.1", listener.getPort(), "/"), ConnectionFailed);
  EXPECT_THROW(WebSocketChannel::connect("127.0.0.1", listener.getPort(), "/s3cres"), ConnectionFailed);
  EXPECT_THROW(WebSocketChannel::connect("127.0.0.1", listener.getPort(), "/s3cret/"), ConnectionFailed);
  EXPECT_LT(std::chrono::steady_clock::now() - started, std::chrono::seconds(5));
  {
    RawPeer wrong(listener.getPort());
    EXPECT_EQ(wrong.handshake(), "HTTP/1.1 403 Forbidden");
  }
  auto client = WebSocketChannel::connect("127.0.0.1", listener.getPort(), "/s3cret");
  auto server = accepted.next();
  ASSERT_TRUE(server);
  EXPECT_EQ(accepted.waiting(), 0u) << "a refused peer was handed over";
  auto inbox = Inbox::startOn(*server);
  client->send("let in");
  EXPECT_EQ(inbox->next(), "let in");
}

std::size_t threadCount() {
  std::size_t count = 0;
  for ([[maybe_unused]] const auto& task : std::filesystem::directory_iterator("/proc/self/task")) ++count;
  return count;
}

// Each handshake under way holds a thread: a flood of silent peers must not pile them up,
// and once the flood is gone, peers are served again.
TEST(WebSocketListener, SilentPeersHoldNoMoreThreadsThanTheHandshakeLimit) {
  AcceptedChannels accepted;
  WebSocketListener listener("127.0.0.1", 0, accepted.handler());
  const std::size_t before = threadCount();
  {
    std::vector<std::unique_ptr<RawPeer>> silent;
    for (int i = 0; i < 200; ++i) silent.push_back(std::make_unique<RawPeer>(listener.getPort()));
    // The listener takes them one by one; wait (boundedly) until the count stops growing.
    std::size_t seen = 0;
    for (int settled = 0, rounds = 0; settled < 5 && rounds < 100; ++rounds) {
      std::this_thread::sleep_for(std::chrono::milliseconds(50));
      const std::size_t now = threadCount();
      settled = now == seen ? settled + 1 : 0;
      seen = now;
    }
    EXPECT_LE(seen, before + WebSocketListener::maxPendingHandshakes + 2);
  }
  std::shared_ptr<SynchronizationChannel> client;
  for (int attempt = 0; attempt < 50 && !client; ++attempt) {
    try {
      client = WebSocketChannel::connect("127.0.0.1", listener.getPort());
    } catch (const ConnectionFailed&) {
      std::this_thread::sleep_for(std::chrono::milliseconds(100));
    }
  }
  ASSERT_TRUE(client) << "the listener serves nobody after the flood";
  EXPECT_TRUE(accepted.next());
}

// What waits to be sent to a peer that reads nothing is bounded: the peer is dropped.
TEST(WebSocketChannel, APeerThatDoesNotReadIsDroppedBeforeMemoryGrows) {
  AcceptedChannels accepted;
  WebSocketListener listener("127.0.0.1", 0, accepted.handler());
  RawPeer deaf(listener.getPort());
  ASSERT_EQ(deaf.handshake(), "HTTP/1.1 101 Switching Protocols");
  auto channel = accepted.next();
  ASSERT_TRUE(channel);
  channel->setMaxMessageSize(64 * 1024);
  auto inbox = Inbox::startOn(*channel);
  const std::string message(32 * 1024, 'x');
  bool dropped = false;
  for (int i = 0; i < 4096 && !dropped; ++i) {  // 128 MiB at most
    try {
      channel->send(message);
    } catch (const Raised<qf0::messages::ChannelClosed>&) {
      dropped = true;
    }
  }
  EXPECT_TRUE(dropped);
  EXPECT_THAT(inbox->closedReason().value_or("none"), testing::StartsWith("connection dropped"));
}

TEST(WebSocketChannel, ATransportAnswersAnOverflowingNumberAndAHandlerThrowingANonExceptionAndCarriesOn) {
  ChannelPair pair = webSocketChannels().connect();
  PacketTransport server(pair.b);
  server.setPacketHandler("Echo", [](const JSONPacket& request) {
    return boost::optional<JSONPacket>(JSONPacket("OK", request.getJson()));
  });
  server.setPacketHandler("Int", [](const JSONPacket&) -> boost::optional<JSONPacket> { throw 42; });
  auto raw = Inbox::startOn(*pair.a);
  const auto nextPacket = [&] {
    const auto text = raw->next();
    if (!text) throw std::runtime_error("nothing arrived");
    return PacketCodec::decode(*text);
  };

  pair.a->send(R"({"type":"Echo","id":9,"body":1e400})");
  const auto malformed = nextPacket();
  EXPECT_EQ(malformed.packet.getType(), "Error");
  EXPECT_EQ(malformed.packet.getJson().at("messageId"), "qf0:messages/MalformedPacket");

  pair.a->send(PacketCodec::encode(JSONPacket("Int", nullptr), 10));
  const auto failed = nextPacket();
  EXPECT_EQ(failed.replyTo, 10u);
  EXPECT_EQ(failed.packet.getJson().at("messageId"), "qf0:messages/PacketHandlerFailed");

  pair.a->send(PacketCodec::encode(JSONPacket("Echo", "still here"), 11));
  const auto echoed = nextPacket();
  EXPECT_EQ(echoed.replyTo, 11u);
  EXPECT_EQ(echoed.packet.getJson(), "still here");
}

}  // namespace support
