#pragma once

#include "qf/zero/io/json_packet.h"

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

namespace qf::zero::io {

// A packet as it travels: the packet, the id its sender gave it, and for a reply the id of the
// request it answers.
struct PacketEnvelope {
  JSONPacket packet;
  std::uint64_t id = 0;
  std::optional<std::uint64_t> replyTo;
};

// Wire form of one packet: a single UTF-8 JSON text
//
//   {"type": "<type>", "id": <uint>, "replyTo": <uint>, "body": <json>}
//
// where "replyTo" is present on replies only. Members are written in that order; a reader accepts
// them in any order and ignores members it does not know, so a later sender may add some.
class PacketCodec {
 public:
  // Deeper nesting is refused when decoding: JSON values are copied and destroyed recursively, so
  // a peer must not be able to choose the stack depth. Generous for any model document.
  static constexpr std::size_t maxNestingDepth = 1000;

  // Longest text an error quotes from a peer, so that an error reply stays small.
  static constexpr std::size_t maxQuotedBytes = 200;

  // Raises MalformedPacket when the type or a string in the body is not valid UTF-8.
  static std::string encode(const JSONPacket& packet, std::uint64_t id,
                            std::optional<std::uint64_t> replyTo = std::nullopt);

  // Raises MalformedPacket naming what is wrong: not JSON, not an object, nested deeper than
  // maxNestingDepth, "type" missing, empty or not a string, "id" missing or not an unsigned
  // integer, "replyTo" present but not an unsigned integer, "body" missing.
  // Nothing else escapes: whatever the text, the message of the MalformedPacket raised is valid
  // UTF-8, so an "Error" packet quoting it always encodes.
  static PacketEnvelope decode(std::string_view text);

  // text made safe to quote in an error: control characters and every byte that is not part of
  // a valid UTF-8 sequence become "\xNN", and text beyond maxBytes is cut at a character boundary
  // and marked with "...". The result is valid UTF-8 of at most maxBytes + 3 bytes.
  static std::string quotable(std::string_view text, std::size_t maxBytes = maxQuotedBytes);
};

}  // namespace qf::zero::io
