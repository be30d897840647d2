#include "qf/zero/io/packet_codec.h"

#include "foundation/core/except/exception.h"
#include "qf/zero/core/messages.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdint>
#include <limits>
#include <string>
#include <utility>
#include <vector>

namespace {

using qf::zero::io::JSONPacket;
using qf::zero::io::PacketCodec;
using Json = nlohmann::ordered_json;
using Malformed = foundation::core::except::Exception<qf0::messages::MalformedPacket>;

TEST(PacketCodec, RequestsAndRepliesSurviveTheRoundTrip) {
  const Json body = {
      {"zeta", {1, 2.5, nullptr}}, {"alpha", "Gr\u00fc\u00dfe \U0001F600"}, {"nested", {{"b", true}}}};
  const auto max = std::numeric_limits<std::uint64_t>::max();

  const auto request = PacketCodec::decode(PacketCodec::encode(JSONPacket("Pull", body), 7));
  EXPECT_EQ(request.packet.getType(), "Pull");
  EXPECT_EQ(request.packet.getJson().dump(), body.dump());  // member order kept
  EXPECT_EQ(request.id, 7u);
  EXPECT_FALSE(request.replyTo.has_value());

  const auto reply = PacketCodec::decode(PacketCodec::encode(JSONPacket("History", "text"), max, max - 1));
  EXPECT_EQ(reply.id, max);
  EXPECT_EQ(reply.replyTo, max - 1);
  EXPECT_EQ(reply.packet.getJson(), "text");

  // Other member orders and unknown members are accepted.
  const auto reordered =
      PacketCodec::decode(R"({"body": {}, "extra": 1, "replyTo": 0, "id": 1, "type": "OK"})");
  EXPECT_EQ(reordered.packet.getType(), "OK");
  EXPECT_EQ(reordered.replyTo, 0u);
}

TEST(PacketCodec, EachMalformedTextIsRefusedNamingWhatIsWrong) {
  const std::size_t tooDeep = PacketCodec::maxNestingDepth + 1;
  const std::string deep = std::string(tooDeep, '[') + std::string(tooDeep, ']');
  const std::string deepInString = R"({"type": "T", "id": 1, "body": ")" + std::string(5000, '[') + "\"}";
  const std::vector<std::pair<std::string, std::string>> cases = {
      {"", "not valid JSON"},
      {"{\"type\": \"T\", \"id\": 1, \"body\": 0", "not valid JSON"},
      {"{\"type\": \"T\", \"id\": 1, \"body\": \"\xc3\x28\"}", "not valid JSON"},
      {"[1, 2]", "array instead of an object"},
      {"\"Pull\"", "string instead of an object"},
      {R"({"id": 1, "body": 0})", "no \"type\""},
      {R"({"type": 3, "id": 1, "body": 0})", "\"type\" is not a string"},
      {R"({"type": "", "id": 1, "body": 0})", "\"type\" is empty"},
      {R"({"type": "T", "body": 0})", "no \"id\""},
      {R"({"type": "T", "id": -1, "body": 0})", "\"id\" is not an unsigned integer"},
      {R"({"type": "T", "id": 1.5, "body": 0})", "\"id\" is not an unsigned integer"},
      {R"({"type": "T", "id": "1", "body": 0})", "\"id\" is not an unsigned integer"},
      {R"({"type": "T", "id": 1, "replyTo": null, "body": 0})", "\"replyTo\" is not an unsigned integer"},
      {R"({"type": "T", "id": 1})", "no \"body\""},
      {deep, "nested deeper than"},
  };
  for (const auto& [text, expected] : cases) {
    try {
      PacketCodec::decode(text);
      ADD_FAILURE() << "accepted: " << text.substr(0, 80);
    } catch (const Malformed& error) {
      EXPECT_THAT(error.what(), testing::HasSubstr(expected)) << text.substr(0, 80);
    }
  }
  // Brackets inside strings are text, not nesting.
  EXPECT_EQ(PacketCodec::decode(deepInString).packet.getJson().get<std::string>().size(), 5000u);
}

TEST(PacketCodec, TextThatIsNotUtf8IsRefusedWhenEncoding) {
  EXPECT_THROW(PacketCodec::encode(JSONPacket("Pull", {{"name", "\xff"}}), 1), Malformed);
  EXPECT_THROW(PacketCodec::encode(JSONPacket("P\xc3", nullptr), 1), Malformed);
}

}  // namespace
