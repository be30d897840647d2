#include "qf/zero/io/packet_transport.h"

#include "foundation/core/except/exception.h"
#include "qf/zero/core/messages.h"
#include "qf/zero/core/report_exception.h"
#include "qf/zero/io/in_process_channel.h"
#include "qf/zero/io/packet_codec.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <chrono>
#include <condition_variable>
#include <deque>
#include <memory>
#include <mutex>
#include <optional>
#include <stdexcept>
#include <string>
#include <utility>

namespace {

// Exchanges over real channels are covered, per channel kind, by support/channel_test_cases.h.

using qf::zero::io::JSONPacket;
using qf::zero::io::PacketCodec;
using qf::zero::io::PacketPromiseMode;
using qf::zero::io::PacketTransport;
using qf::zero::io::SynchronizationChannel;
using Json = nlohmann::ordered_json;
using namespace std::string_literals;

constexpr auto patience = std::chrono::seconds(10);

TEST(PacketTransport, ANullChannelIsRefusedWithACatalogError) {
  try {
    qf::zero::io::PacketTransport transport{std::shared_ptr<qf::zero::io::SynchronizationChannel>()};
    FAIL() << "a transport was made without a channel";
  } catch (const foundation::core::except::ExceptionBase& error) {
    EXPECT_EQ(error.GetID(), "qf0:messages/CannotCreateTransportWithoutChannel");
  }
}

// A transport serving on one end of an in-process pair; the test speaks the wire form on the
// other end, so it sees exactly what the server sends.
class ServingTransport : public testing::Test {
 protected:
  void SetUp() override {
    auto [a, b] = qf::zero::io::InProcessChannel::createPair();
    peer_ = a;
    peer_->start(
        [this](std::string message) {
          std::lock_guard lock(mutex_);
          inbox_.push_back(std::move(message));
          arrived_.notify_all();
        },
        [](const std::string&) {});
    server = std::make_unique<PacketTransport>(b);
    server->setPacketHandler("Echo", [](const JSONPacket& request) {
      return boost::optional<JSONPacket>(JSONPacket("OK", request.getJson()));
    });
  }

  void TearDown() override {
    server.reset();
    peer_->close();
  }

  void sendRaw(std::string text) { peer_->send(std::move(text)); }

  // The next packet the server sent, or nothing within patience.
  std::optional<qf::zero::io::PacketEnvelope> next() {
    std::unique_lock lock(mutex_);
    if (!arrived_.wait_for(lock, patience, [&] { return !inbox_.empty(); })) return std::nullopt;
    std::string text = std::move(inbox_.front());
    inbox_.pop_front();
    return PacketCodec::decode(text);
  }

  // The server still answers: the transport survived whatever came before.
  void expectStillServing() {
    sendRaw(PacketCodec::encode(JSONPacket("Echo", "again"), 77));
    const auto reply = next();
    ASSERT_TRUE(reply) << "no reply to a good request";
    EXPECT_EQ(reply->replyTo, 77u);
    EXPECT_EQ(reply->packet.getJson(), "again");
  }

  std::unique_ptr<PacketTransport> server;

 private:
  std::shared_ptr<SynchronizationChannel> peer_;
  std::mutex mutex_;
  std::condition_variable arrived_;
  std::deque<std::string> inbox_;
};

class HostileTextToTransport : public ServingTransport, public testing::WithParamInterface<std::string> {};

TEST_P(HostileTextToTransport, IsAnsweredWithMalformedPacketAndTheServerCarriesOn) {
  sendRaw(GetParam());
  const auto error = next();
  ASSERT_TRUE(error) << "no reply";
  EXPECT_EQ(error->packet.getType(), "Error");
  EXPECT_FALSE(error->replyTo.has_value());
  EXPECT_EQ(error->packet.getJson().at("messageId"), "qf0:messages/MalformedPacket");
  expectStillServing();
}

INSTANTIATE_TEST_SUITE_P(Cases, HostileTextToTransport,
                         testing::Values(
                             // number overflow
                             R"({"type":"Echo","id":9,"body":1e400})"s,
                             // invalid UTF-8 in text that is not JSON, and inside a JSON string
                             "\xff\xfe not json \xc3"s, "{\"type\":\"Echo\",\"id\":9,\"body\":\"\xff\"}"s,
                             // a long unterminated string of invalid bytes
                             "\"" + std::string(50000, '\xfe'),
                             // binary garbage with NUL bytes
                             "\0\x01\x80\x7f{["s));

// Each case: the packet type, and whether its handler runs on the worker thread.
class ThrowingHandler : public ServingTransport,
                        public testing::WithParamInterface<std::pair<std::string, PacketPromiseMode>> {
 protected:
  void SetUp() override {
    ServingTransport::SetUp();
    const PacketPromiseMode mode = GetParam().second;
    server->setPacketHandler(
        "RuntimeError",
        [](const JSONPacket&) -> boost::optional<JSONPacket> { throw std::runtime_error("disk full \xff"); },
        mode);
    server->setPacketHandler(
        "Int", [](const JSONPacket&) -> boost::optional<JSONPacket> { throw 42; }, mode);
    server->setPacketHandler(
        "Catalog",
        [](const JSONPacket&) -> boost::optional<JSONPacket> {
          qf::zero::reportException(qf0::messages::NoSuchType(u"Widget"));
        },
        mode);
    // A reply the handler made itself that cannot be encoded.
    server->setPacketHandler(
        "BadError",
        [](const JSONPacket&) {
          return boost::optional<JSONPacket>(JSONPacket("Error", {{"message", "\xc3("}}));
        },
        mode);
  }
};

TEST_P(ThrowingHandler, TheRequestIsAnsweredWithAnErrorAndTheServerCarriesOn) {
  const std::string& type = GetParam().first;
  sendRaw(PacketCodec::encode(JSONPacket(type, nullptr), 5));
  const auto error = next();
  ASSERT_TRUE(error) << "no reply";
  EXPECT_EQ(error->replyTo, 5u);
  EXPECT_EQ(error->packet.getType(), "Error");
  const Json& body = error->packet.getJson();
  const std::string message = body.value("message", "");
  if (type == "RuntimeError") {
    EXPECT_EQ(body.at("messageId"), "qf0:messages/PacketHandlerFailed");
    EXPECT_THAT(message, testing::HasSubstr("disk full"));
    EXPECT_THAT(message, testing::HasSubstr("'RuntimeError'"));
  } else if (type == "Int") {
    EXPECT_EQ(body.at("messageId"), "qf0:messages/PacketHandlerFailed");
    EXPECT_THAT(message, testing::HasSubstr("not a std::exception"));
  } else if (type == "Catalog") {
    EXPECT_EQ(body.at("messageId"), "qf0:messages/NoSuchType");
    EXPECT_EQ(message, "The type 'Widget' is not registered.");
  } else {
    EXPECT_EQ(body.at("messageId"), "qf0:messages/MalformedPacket");
  }
  expectStillServing();
}

INSTANTIATE_TEST_SUITE_P(Cases, ThrowingHandler,
                         testing::Values(std::pair{"RuntimeError"s, PacketPromiseMode::OnReceivingThread},
                                         std::pair{"RuntimeError"s, PacketPromiseMode::OnWorkerThread},
                                         std::pair{"Int"s, PacketPromiseMode::OnReceivingThread},
                                         std::pair{"Int"s, PacketPromiseMode::OnWorkerThread},
                                         std::pair{"Catalog"s, PacketPromiseMode::OnReceivingThread},
                                         std::pair{"BadError"s, PacketPromiseMode::OnReceivingThread},
                                         std::pair{"BadError"s, PacketPromiseMode::OnWorkerThread}),
                         [](const auto& info) {
                           return info.param.first + (info.param.second == PacketPromiseMode::OnWorkerThread
                                                          ? "OnWorker"
                                                          : "OnReceiver");
                         });

}  // namespace
