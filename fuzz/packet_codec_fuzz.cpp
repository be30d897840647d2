// Any text a peer sends: decoding either gives a packet that encodes and decodes back to
// itself, or raises MalformedPacket with a message an "Error" reply can quote.
#include "foundation/core/except/exception.h"
#include "qf/zero/io/packet_codec.h"

#include <nlohmann/json.hpp>

#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <optional>
#include <string_view>

namespace {

using qf::zero::io::JSONPacket;
using qf::zero::io::PacketCodec;
using qf::zero::io::PacketEnvelope;

[[noreturn]] void fail(const char* what) {
  std::fprintf(stderr, "packet codec: %s\n", what);
  std::abort();
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const std::string_view text(reinterpret_cast<const char*>(data), size);
  std::optional<PacketEnvelope> decoded;
  try {
    decoded.emplace(PacketCodec::decode(text));
  } catch (const foundation::core::except::ExceptionBase& refused) {
    // What the transport does with it: an "Error" reply quoting the message must encode.
    (void)PacketCodec::encode(JSONPacket("Error", {{"message", refused.message()}}), 1);
    return 0;
  }
  const PacketEnvelope& envelope = *decoded;
  const std::string again = PacketCodec::encode(envelope.packet, envelope.id, envelope.replyTo);
  const PacketEnvelope back = PacketCodec::decode(again);
  if (back.packet.getType() != envelope.packet.getType()) fail("the type changed on the way");
  if (back.id != envelope.id || back.replyTo != envelope.replyTo) fail("the ids changed on the way");
  if (back.packet.getJson() != envelope.packet.getJson()) fail("the body changed on the way");
  if (PacketCodec::encode(back.packet, back.id, back.replyTo) != again) fail("encoding is not stable");
  return 0;
}
