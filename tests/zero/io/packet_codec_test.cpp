#include "qf/zero/io/packet_codec.h"

#include "foundation/core/except/exception.h"
#include "qf/zero/core/messages.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstddef>
#include <cstdint>
#include <limits>
#include <ostream>
#include <random>
#include <string>
#include <utility>
#include <vector>

namespace {

using qf::zero::io::JSONPacket;
using qf::zero::io::PacketCodec;
using Json = nlohmann::ordered_json;
using Malformed = foundation::core::except::Exception<qf0::messages::MalformedPacket>;
using namespace std::string_literals;

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

// Whatever a peer sends, decoding raises MalformedPacket and nothing else, and an "Error" packet
// quoting its message can be encoded: otherwise the peer would get no answer at all.
struct HostileText {
  std::string text;
  std::string expected;  // part of the message
};

void PrintTo(const HostileText& input, std::ostream* out) { *out << PacketCodec::quotable(input.text, 60); }

class PacketCodecHostileInput : public testing::TestWithParam<HostileText> {};

TEST_P(PacketCodecHostileInput, IsMalformedWithAnEncodableBoundedMessage) {
  const auto& [text, expected] = GetParam();
  try {
    PacketCodec::decode(text);
    ADD_FAILURE() << "accepted";
  } catch (const Malformed& error) {
    const std::string message = error.what();
    EXPECT_THAT(message, testing::HasSubstr(expected));
    EXPECT_NO_THROW(PacketCodec::encode(JSONPacket("Error", {{"message", message}}), 1)) << message;
    EXPECT_LT(message.size(), PacketCodec::maxQuotedBytes + 200);
  } catch (const std::exception& error) {
    ADD_FAILURE() << "not MalformedPacket: " << error.what();
  }
}

std::string nested(std::size_t depth) { return std::string(depth, '[') + std::string(depth, ']'); }

std::string allBytes() {
  std::string bytes;
  for (int i = 0; i < 256; ++i) bytes += static_cast<char>(255 - i);
  return bytes;
}

INSTANTIATE_TEST_SUITE_P(
    Cases, PacketCodecHostileInput,
    testing::Values(
        // number overflow in the body, in the id, and a 400-digit integer
        HostileText{R"({"type":"Echo","id":9,"body":1e400})", "overflow"},
        HostileText{R"({"type":"Echo","id":1e400,"body":0})", "overflow"},
        HostileText{R"({"type":"Echo","id":1)" + std::string(400, '0') + R"(,"body":0})", "overflow"},
        // ids beyond 64 bits become floating point
        HostileText{R"({"type":"Echo","id":18446744073709551616,"body":0})", "\"id\" is not an unsigned"},
        HostileText{R"({"type":"Echo","id":1,"replyTo":-18446744073709551617,"body":0})",
                    "\"replyTo\" is not an unsigned"},
        // invalid UTF-8 inside a JSON string, as a bare JSON token, and in text that is not JSON
        HostileText{"{\"type\":\"Echo\",\"id\":1,\"body\":\"ok \xff\xfe\"}", "not valid JSON"},
        HostileText{"{\"type\":\"Echo\",\"id\":1,\"body\":\xc3\x28}", "not valid JSON"},
        HostileText{"\xff\xfe\xc0\xaf not json \xed\xa0\x80", "not valid JSON"},
        HostileText{"\xe2\x82", "not valid JSON"},
        // an unterminated string far longer than any error may quote
        HostileText{"{\"type\":\"" + std::string(100000, 'a') + "\xff", "not valid JSON"},
        HostileText{"{\"type\":\"Echo\",\"id\":1,\"body\":\"" + std::string(100000, '\xff'),
                    "not valid JSON"},
        // deeply nested arrays, alone and as a body
        HostileText{nested(100000), "nested deeper than"},
        HostileText{R"({"type":"Echo","id":1,"body":)" + nested(PacketCodec::maxNestingDepth) + "}",
                    "nested deeper than"},
        // wrong field types
        HostileText{R"({"type":["Echo"],"id":1,"body":0})", "\"type\" is not a string"},
        HostileText{R"({"type":"Echo","id":true,"body":0})", "\"id\" is not an unsigned"},
        HostileText{R"({"type":"Echo","id":{},"body":0})", "\"id\" is not an unsigned"},
        HostileText{R"({"type":"Echo","id":1,"replyTo":"2","body":0})", "\"replyTo\" is not an unsigned"},
        // missing fields
        HostileText{"{}", "no \"type\""}, HostileText{R"({"type":"Echo","body":0})", "no \"id\""},
        HostileText{R"({"type":"Echo","id":1})", "no \"body\""},
        // empty and blank text, a bare number, NUL bytes, binary garbage
        HostileText{"", "not valid JSON"}, HostileText{" \t\r\n", "not valid JSON"},
        HostileText{"12", "number instead of an object"},
        HostileText{"{\"type\":\"Echo\0\",\"id\":1,\"body\":0}"s, "not valid JSON"},
        HostileText{allBytes(), "not valid JSON"}));

TEST(PacketCodec, DecodingRandomBytesRaisesOnlyMalformedPacketWithAnEncodableMessage) {
  // Half the texts are a valid packet with a few bytes changed, so parsing gets past the start.
  const std::uint64_t seed = 20261124;
  SCOPED_TRACE("seed " + std::to_string(seed));
  std::mt19937_64 random(seed);
  const std::string valid = PacketCodec::encode(JSONPacket("Echo", {{"a", {1, 2.5, "x\u00e9"}}}), 42, 7);
  for (int round = 0; round < 3000; ++round) {
    std::string text;
    if (round % 2 == 0) {
      text.resize(random() % 64);
      for (char& c : text) c = static_cast<char>(random());
    } else {
      text = valid;
      for (int k = 0; k <= static_cast<int>(random() % 4); ++k)
        text[random() % text.size()] = static_cast<char>(random());
    }
    try {
      PacketCodec::decode(text);
    } catch (const Malformed& error) {
      ASSERT_NO_THROW(PacketCodec::encode(JSONPacket("Error", {{"message", error.what()}}), 1))
          << "round " << round;
    } catch (...) {
      FAIL() << "round " << round << ": something other than MalformedPacket escaped";
    }
  }
}

// Each case: the text, what quoting it gives.
class PacketCodecQuotable : public testing::TestWithParam<std::pair<std::string, std::string>> {};

TEST_P(PacketCodecQuotable, EscapesWhatIsNotPrintableUtf8AndCutsAtACharacter) {
  EXPECT_EQ(PacketCodec::quotable(GetParam().first, 8), GetParam().second);
}

INSTANTIATE_TEST_SUITE_P(Cases, PacketCodecQuotable,
                         testing::Values(
                             // valid text of every sequence length is kept
                             std::pair<std::string, std::string>{"a\u00e9\u20ac", "a\u00e9\u20ac"},
                             std::pair<std::string, std::string>{"\U0001F600", "\U0001F600"},
                             // stray, overlong, surrogate, beyond U+10FFFF, truncated: each byte escaped
                             std::pair<std::string, std::string>{"\xff", "\\xFF"},
                             std::pair<std::string, std::string>{"\xc0\xaf", "\\xC0\\xAF"},
                             std::pair<std::string, std::string>{"\xed\xa0\x80", "\\xED\\xA0..."},
                             std::pair<std::string, std::string>{"\xf4\x90", "\\xF4\\x90"},
                             std::pair<std::string, std::string>{"a\xe2\x82", "a\\xE2..."},
                             // control characters
                             std::pair<std::string, std::string>{"\0\n"s, "\\x00\\x0A"},
                             // cut at the limit, never inside a character
                             std::pair<std::string, std::string>{"abcdefghij", "abcdefgh..."},
                             std::pair<std::string, std::string>{"abcdef\u20ac", "abcdef..."}));

TEST(PacketCodec, TextThatIsNotUtf8IsRefusedWhenEncoding) {
  EXPECT_THROW(PacketCodec::encode(JSONPacket("Pull", {{"name", "\xff"}}), 1), Malformed);
  EXPECT_THROW(PacketCodec::encode(JSONPacket("P\xc3", nullptr), 1), Malformed);
}

}  // namespace
