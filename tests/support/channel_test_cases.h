#pragma once

// Cases every SynchronizationChannel kind must pass, alone (ChannelContract) and under a
// PacketTransport (PacketExchange). Included once per test program, which instantiates them for
// the channel kinds it covers:
//
//   INSTANTIATE_TEST_SUITE_P(InProcess, ChannelContract, testing::Values(inProcessChannels()), kindName);

#include "foundation/core/except/exception.h"
#include "qf/zero/core/messages.h"
#include "qf/zero/core/report_exception.h"
#include "qf/zero/io/json_packet.h"
#include "qf/zero/io/packet_codec.h"
#include "qf/zero/io/packet_transport.h"
#include "qf/zero/io/synchronization_channel.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <deque>
#include <functional>
#include <future>
#include <memory>
#include <mutex>
#include <optional>
#include <ostream>
#include <stdexcept>
#include <string>
#include <thread>
#include <utility>
#include <vector>

namespace support {

using qf::zero::io::JSONPacket;
using qf::zero::io::PacketCodec;
using qf::zero::io::PacketPromiseMode;
using qf::zero::io::PacketTransport;
using qf::zero::io::SynchronizationChannel;
using Json = nlohmann::ordered_json;
template <class M>
using Raised = foundation::core::except::Exception<M>;

// Long enough for any loaded machine, short enough that a hang fails the test instead of the run.
constexpr auto patience = std::chrono::seconds(10);

struct ChannelPair {
  std::shared_ptr<SynchronizationChannel> a;
  std::shared_ptr<SynchronizationChannel> b;
};

struct ChannelKind {
  std::string name;
  std::function<ChannelPair()> connect;
};

inline std::string kindName(const testing::TestParamInfo<ChannelKind>& info) { return info.param.name; }
inline void PrintTo(const ChannelKind& kind, std::ostream* out) { *out << kind.name; }

// Records what a started channel delivers. Shared with the callbacks, so it may outlive the test.
class Inbox : public std::enable_shared_from_this<Inbox> {
 public:
  static std::shared_ptr<Inbox> startOn(SynchronizationChannel& channel) {
    auto inbox = std::make_shared<Inbox>();
    channel.start([inbox](std::string message) { inbox->add(std::move(message)); },
                  [inbox](const std::string& reason) { inbox->close(reason); });
    return inbox;
  }

  // The next message, or nothing when none came within patience or the channel closed first.
  std::optional<std::string> next() {
    std::unique_lock lock(mutex_);
    changed_.wait_for(lock, patience, [&] { return !messages_.empty() || closes_ > 0; });
    if (messages_.empty()) return std::nullopt;
    std::string message = std::move(messages_.front());
    messages_.pop_front();
    return message;
  }

  std::optional<std::string> closedReason() {
    std::unique_lock lock(mutex_);
    changed_.wait_for(lock, patience, [&] { return closes_ > 0; });
    return closes_ > 0 ? std::optional<std::string>(reason_) : std::nullopt;
  }

  int closeCount() {
    std::lock_guard lock(mutex_);
    return closes_;
  }

  std::vector<std::thread::id> deliveringThreads() {
    std::lock_guard lock(mutex_);
    return threads_;
  }

  std::function<void(const std::string&)> onEachMessage;  // set before start; runs in the callback

 private:
  void add(std::string message) {
    if (onEachMessage) onEachMessage(message);
    std::lock_guard lock(mutex_);
    threads_.push_back(std::this_thread::get_id());
    messages_.push_back(std::move(message));
    changed_.notify_all();
  }

  void close(const std::string& reason) {
    std::lock_guard lock(mutex_);
    threads_.push_back(std::this_thread::get_id());
    reason_ = reason;
    ++closes_;
    changed_.notify_all();
  }

  std::mutex mutex_;
  std::condition_variable changed_;
  std::deque<std::string> messages_;
  std::vector<std::thread::id> threads_;
  std::string reason_;
  int closes_ = 0;
};

class ChannelContract : public testing::TestWithParam<ChannelKind> {
 protected:
  ChannelPair pair = GetParam().connect();
};

TEST_P(ChannelContract, DeliversInOrderOnItsOwnThreadWhatWasSentBeforeAndAfterStart) {
  pair.a->send("early");
  auto inbox = Inbox::startOn(*pair.b);
  for (int i = 0; i < 200; ++i) pair.a->send("m" + std::to_string(i));

  EXPECT_EQ(inbox->next(), "early");
  for (int i = 0; i < 200; ++i) ASSERT_EQ(inbox->next(), "m" + std::to_string(i));
  const auto threads = inbox->deliveringThreads();
  EXPECT_NE(threads.front(), std::this_thread::get_id());
  EXPECT_THAT(threads, testing::Each(threads.front()));
  EXPECT_THROW(pair.b->start([](std::string) {}, [](const std::string&) {}),
               Raised<qf0::messages::ChannelAlreadyStarted>);
}

TEST_P(ChannelContract, ClosingOneEndClosesBothExactlyOnceAndRefusesFurtherSends) {
  auto inboxA = Inbox::startOn(*pair.a);
  auto inboxB = Inbox::startOn(*pair.b);
  pair.a->close();
  // From another thread close() returns after onClosed ran.
  EXPECT_EQ(inboxA->closeCount(), 1);
  EXPECT_EQ(inboxA->closedReason(), "closed locally");
  EXPECT_THAT(inboxB->closedReason().value_or("none"), testing::StartsWith("closed by the peer"));
  EXPECT_FALSE(pair.a->isOpen());
  EXPECT_FALSE(pair.b->isOpen());
  EXPECT_THROW(pair.a->send("late"), Raised<qf0::messages::ChannelClosed>);
  EXPECT_THROW(pair.b->send("late"), Raised<qf0::messages::ChannelClosed>);
  pair.a->close();
  pair.b->close();
  EXPECT_EQ(inboxA->closeCount(), 1);
  EXPECT_EQ(inboxB->closeCount(), 1);
}

TEST_P(ChannelContract, MessagesQueuedBeforeCloseStillReachThePeer) {
  auto inboxB = Inbox::startOn(*pair.b);
  for (int i = 0; i < 50; ++i) pair.a->send(std::string(1000, 'x') + std::to_string(i));
  pair.a->close();
  for (int i = 0; i < 50; ++i) ASSERT_EQ(inboxB->next(), std::string(1000, 'x') + std::to_string(i));
  EXPECT_TRUE(inboxB->closedReason().has_value());
}

TEST_P(ChannelContract, AnEndMayBeClosedOrReleasedFromInsideItsOwnCallback) {
  // b says goodbye and closes itself from its callback; a, whose last reference is held by its
  // own callback, is released there when the goodbye arrives.
  std::weak_ptr<SynchronizationChannel> weakB = pair.b;
  pair.b->start(
      [weakB](const std::string& message) {
        if (auto b = weakB.lock(); b && message == "close yourself") {
          b->send("bye");
          b->close();
        }
      },
      [](const std::string&) {});
  auto holder = std::make_shared<std::shared_ptr<SynchronizationChannel>>(pair.a);
  auto aClosed = std::make_shared<std::promise<void>>();
  pair.a->start(
      [holder](const std::string& message) {
        if (message == "bye") holder->reset();
      },
      [aClosed](const std::string&) { aClosed->set_value(); });
  pair.a.reset();

  (*holder)->send("close yourself");
  ASSERT_EQ(aClosed->get_future().wait_for(patience), std::future_status::ready);
  EXPECT_THROW(pair.b->send("x"), Raised<qf0::messages::ChannelClosed>);
}

TEST_P(ChannelContract, AnOversizeMessageIsRefusedWhenSentAndClosesTheConnectionWhenReceived) {
  pair.a->setMaxMessageSize(16);
  pair.b->setMaxMessageSize(8);
  auto inboxA = Inbox::startOn(*pair.a);
  auto inboxB = Inbox::startOn(*pair.b);

  EXPECT_THROW(pair.a->send(std::string(17, 'x')), Raised<qf0::messages::PacketTooLarge>);
  EXPECT_TRUE(pair.a->isOpen());
  pair.a->send("8 bytes!");
  EXPECT_EQ(inboxB->next(), "8 bytes!");

  pair.a->send("twelve bytes");
  EXPECT_THAT(inboxB->closedReason().value_or("none"), testing::StartsWith("PacketTooLarge"));
  EXPECT_THAT(inboxA->closedReason().value_or("none"), testing::HasSubstr("PacketTooLarge"));
}

// A PacketTransport on b serving requests, and on a either a transport or, for tests that speak
// the wire form themselves, the bare channel.
class PacketExchange : public testing::TestWithParam<ChannelKind> {
 protected:
  ChannelPair pair = GetParam().connect();
  std::unique_ptr<PacketTransport> server;
  std::unique_ptr<PacketTransport> client;

  void SetUp() override {
    server = std::make_unique<PacketTransport>(pair.b);
    server->setPacketHandler("Echo", [](const JSONPacket& request) {
      return boost::optional<JSONPacket>(JSONPacket("OK", request.getJson()));
    });
  }

  void connectClient() { client = std::make_unique<PacketTransport>(pair.a); }

  static JSONPacket decodeBody(const std::optional<std::string>& text, std::optional<std::uint64_t> replyTo) {
    if (!text) throw std::runtime_error("nothing arrived");
    auto envelope = PacketCodec::decode(*text);
    EXPECT_EQ(envelope.replyTo, replyTo);
    return envelope.packet;
  }
};

TEST_P(PacketExchange, ARequestGetsItsReplyFromTheHandlerSetLast) {
  connectClient();
  const Json body = {{"zeta", 1}, {"alpha", "ä\u20ac"}, {"list", {1, 2, 3}}};
  const JSONPacket reply = client->sendAndExpectPacket(JSONPacket("Echo", body), "OK");
  EXPECT_EQ(reply.getType(), "OK");
  EXPECT_EQ(reply.getJson().dump(), body.dump());  // member order kept

  server->setPacketHandler(
      "Echo", [](const JSONPacket&) { return boost::optional<JSONPacket>(JSONPacket("Other", 2)); });
  EXPECT_EQ(client->sendAndExpectPacket(JSONPacket("Echo", 1), "OK").getType(), "Other");
}

TEST_P(PacketExchange, ConcurrentExchangesFromManyThreadsEachGetTheirOwnReply) {
  // Replies from the worker come after later replies from the receiving thread, so any
  // matching by order instead of by id mixes them up.
  server->setPacketHandler(
      "Delayed",
      [](const JSONPacket& request) {
        std::this_thread::sleep_for(std::chrono::microseconds(200));
        return boost::optional<JSONPacket>(JSONPacket("OK", request.getJson()));
      },
      PacketPromiseMode::OnWorkerThread);
  connectClient();
  std::atomic<int> mismatches{0};
  std::vector<std::thread> threads;
  for (int t = 0; t < 8; ++t) {
    threads.emplace_back([&, t] {
      for (int i = 0; i < 40; ++i) {
        const Json body = {{"thread", t}, {"i", i}};
        const auto reply = client->sendAndExpectPacket(JSONPacket(i % 2 ? "Delayed" : "Echo", body), "OK");
        if (reply.getJson() != body) ++mismatches;
      }
    });
  }
  for (auto& thread : threads) thread.join();
  EXPECT_EQ(mismatches, 0);
}

TEST_P(PacketExchange, FaultyHandlersAndUnknownTypesAreAnsweredWithErrorReplies) {
  server->setPacketHandler("Throw", [](const JSONPacket&) -> boost::optional<JSONPacket> {
    throw std::runtime_error("boom \xff");
  });
  server->setPacketHandler(
      "Raise",
      [](const JSONPacket&) -> boost::optional<JSONPacket> {
        qf::zero::reportException(qf0::messages::NoSuchType(u"Widget"));
      },
      PacketPromiseMode::OnWorkerThread);
  server->setPacketHandler("Nested", [this](const JSONPacket&) {
    return boost::optional<JSONPacket>(server->sendAndExpectPacket(JSONPacket("Echo", 0), "OK"));
  });
  connectClient();

  const auto thrown = client->sendAndExpectPacket(JSONPacket("Throw", nullptr), "OK");
  EXPECT_EQ(thrown.getType(), "Error");
  EXPECT_THAT(thrown.getJson().at("message").get<std::string>(), testing::StartsWith("boom "));

  const auto raised = client->sendAndExpectPacket(JSONPacket("Raise", nullptr), "OK");
  EXPECT_EQ(raised.getType(), "Error");
  EXPECT_EQ(raised.getJson().at("messageId"), "qf0:messages/NoSuchType");
  EXPECT_THAT(raised.getJson().at("message").get<std::string>(), testing::HasSubstr("Widget"));

  const auto unknown = client->sendAndExpectPacket(JSONPacket("Nobody", nullptr), "OK");
  EXPECT_EQ(unknown.getType(), "Error");
  EXPECT_EQ(unknown.getJson().at("messageId"), "qf0:messages/UnknownPacketType");
  EXPECT_THAT(unknown.getJson().at("message").get<std::string>(), testing::HasSubstr("Nobody"));

  // Waiting for a reply on the thread that must receive it fails at once instead of forever.
  const auto nested = client->sendAndExpectPacket(
      JSONPacket("Nested", nullptr), "OK", std::chrono::duration_cast<std::chrono::milliseconds>(patience));
  EXPECT_EQ(nested.getJson().at("messageId"), "qf0:messages/ExchangeFailed");

  EXPECT_EQ(client->sendAndExpectPacket(JSONPacket("Echo", 5), "OK").getJson(), 5);
}

TEST_P(PacketExchange, APeerThatDisconnectsMidExchangeFailsTheWaitingExchangePromptly) {
  std::promise<void> entered;
  server->setPacketHandler("Hold", [&entered](const JSONPacket&) {
    entered.set_value();
    return boost::optional<JSONPacket>();  // never answers
  });
  connectClient();
  const auto hold = [&] { return client->sendAndExpectPacket(JSONPacket("Hold", 0), "OK"); };
  auto exchange = std::async(std::launch::async, hold);
  ASSERT_EQ(entered.get_future().wait_for(patience), std::future_status::ready);
  server.reset();

  ASSERT_EQ(exchange.wait_for(patience), std::future_status::ready);
  EXPECT_THROW(exchange.get(), Raised<qf0::messages::ExchangeFailed>);
  EXPECT_THROW(client->sendAndExpectPacket(JSONPacket("Echo", 0), "OK"),
               Raised<qf0::messages::ExchangeFailed>);
}

TEST_P(PacketExchange, ClosingOrTimingOutFailsTheExchangesInFlight) {
  server->setPacketHandler("Hold", [](const JSONPacket&) { return boost::optional<JSONPacket>(); });
  connectClient();
  try {
    client->sendAndExpectPacket(JSONPacket("Hold", 0), "OK", std::chrono::milliseconds(50));
    ADD_FAILURE() << "no timeout";
  } catch (const Raised<qf0::messages::ExchangeFailed>& error) {
    EXPECT_THAT(error.what(), testing::HasSubstr("'OK'"));
  }

  const auto hold = [&] { return client->sendAndExpectPacket(JSONPacket("Hold", 0), "OK"); };
  std::vector<std::future<JSONPacket>> exchanges;
  for (int i = 0; i < 4; ++i) exchanges.push_back(std::async(std::launch::async, hold));
  std::this_thread::sleep_for(std::chrono::milliseconds(20));
  client->close();
  for (auto& exchange : exchanges) {
    ASSERT_EQ(exchange.wait_for(patience), std::future_status::ready);
    EXPECT_THROW(exchange.get(), Raised<qf0::messages::ExchangeFailed>);
  }
  EXPECT_FALSE(client->isOpen());
}

TEST_P(PacketExchange, AnOversizePacketIsRefusedBeforeSendingAndEndsTheConnectionWhenReceived) {
  pair.a->setMaxMessageSize(4096);
  connectClient();
  const JSONPacket big("Echo", std::string(5000, 'x'));
  EXPECT_THROW(client->sendAndExpectPacket(big, "OK"), Raised<qf0::messages::PacketTooLarge>);
  EXPECT_EQ(client->sendAndExpectPacket(JSONPacket("Echo", 1), "OK").getJson(), 1);

  pair.b->setMaxMessageSize(1024);
  client->sendAndExpectPacket(JSONPacket("Echo", 2), "OK");  // the server reads with the new limit now
  try {
    client->sendAndExpectPacket(JSONPacket("Echo", std::string(2000, 'y')), "OK");
    ADD_FAILURE() << "the server accepted an oversize packet";
  } catch (const Raised<qf0::messages::ExchangeFailed>& error) {
    EXPECT_THAT(error.what(), testing::HasSubstr("PacketTooLarge"));
  }
}

TEST_P(PacketExchange, BadTextFromThePeerIsAnsweredOrDroppedAndTheTransportCarriesOn) {
  auto raw = Inbox::startOn(*pair.a);

  pair.a->send("{not json");
  const auto error = decodeBody(raw->next(), std::nullopt);
  EXPECT_EQ(error.getType(), "Error");
  EXPECT_EQ(error.getJson().at("messageId"), "qf0:messages/MalformedPacket");
  pair.a->send(R"({"type": "Echo", "id": -3, "body": 0})");
  EXPECT_EQ(decodeBody(raw->next(), std::nullopt).getJson().at("messageId"), "qf0:messages/MalformedPacket");
  pair.a->send(std::string(PacketCodec::maxNestingDepth + 1, '['));
  EXPECT_EQ(decodeBody(raw->next(), std::nullopt).getType(), "Error");

  // Neither a reply nobody waits for nor an Error packet is answered: the next thing to arrive
  // is the reply to the request sent after them.
  pair.a->send(PacketCodec::encode(JSONPacket("OK", 1), 1, 999));
  pair.a->send(PacketCodec::encode(JSONPacket("Error", {{"message", "yours"}}), 2));
  pair.a->send(PacketCodec::encode(JSONPacket("Echo", "still here"), 3));
  const auto reply = decodeBody(raw->next(), 3);
  EXPECT_EQ(reply.getJson(), "still here");
}

TEST_P(PacketExchange, AWorkerThreadHandlerMayItselfExchangeWithThePeer) {
  server->setPacketHandler(
      "Ask",
      [this](const JSONPacket& request) {
        const auto answer = server->sendAndExpectPacket(JSONPacket("Lookup", request.getJson()), "Found");
        return boost::optional<JSONPacket>(JSONPacket("OK", answer.getJson().get<int>() + 1));
      },
      PacketPromiseMode::OnWorkerThread);
  connectClient();
  client->setPacketHandler("Lookup", [](const JSONPacket& request) {
    return boost::optional<JSONPacket>(JSONPacket("Found", request.getJson().get<int>() * 10));
  });
  EXPECT_EQ(client->sendAndExpectPacket(JSONPacket("Ask", 4), "OK").getJson(), 41);
}

TEST_P(PacketExchange, ATransportMayBeDestroyedWhileThePeerKeepsSending) {
  std::atomic<int> received{0};
  server->setPacketHandler("Note", [&received](const JSONPacket&) {
    ++received;
    return boost::optional<JSONPacket>();
  });
  connectClient();
  // The flood keeps a window of unread notes, no more: unbounded, a sender whose I/O thread is
  // starved would pass its own limit of unsent bytes and drop the connection before the server
  // had read a hundred notes. Once the server is gone the window stays full until the close
  // reaches the client.
  constexpr int window = 1000;
  const auto deadline = std::chrono::steady_clock::now() + patience;
  std::thread flood([&] {
    int sent = 0;
    try {
      while (pair.a->isOpen() && std::chrono::steady_clock::now() < deadline + patience) {
        if (sent - received >= window) {
          std::this_thread::yield();
          continue;
        }
        client->sendPacket(JSONPacket("Note", {{"payload", std::string(100, 'n')}}));
        ++sent;
      }
    } catch (const Raised<qf0::messages::ChannelClosed>&) {
    }
  });
  while (received < 100 && std::chrono::steady_clock::now() < deadline) std::this_thread::yield();
  EXPECT_GE(received, 100);
  server.reset();
  flood.join();
  EXPECT_FALSE(pair.a->isOpen());
}

}  // namespace support
