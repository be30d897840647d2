#include "qf/zero/io/packet_codec.h"

#include "qf/zero/core/json_parse.h"
#include "qf/zero/core/messages.h"
#include "qf/zero/core/report_exception.h"

#include <algorithm>
#include <string>
#include <utility>

namespace qf::zero::io {

namespace {

using Json = nlohmann::ordered_json;

[[noreturn]] void malformed(std::string what) {
  reportException(qf0::messages::MalformedPacket(std::move(what)));
}

// Strict: a string that is not valid UTF-8 is refused rather than silently altered.
std::string dumpStrict(const Json& value, const char* what) {
  try {
    return value.dump();
  } catch (const nlohmann::json::type_error&) {
    malformed(std::string(what) + " holds text that is not valid UTF-8");
  }
}

// Linear scan ahead of parsing, so that a hostile text is refused before any value is built.
// Brackets inside strings do not count; escapes inside strings are skipped.
void checkNesting(std::string_view text) {
  std::size_t depth = 0;
  bool inString = false;
  for (std::size_t i = 0; i < text.size(); ++i) {
    const char c = text[i];
    if (inString) {
      if (c == '\\')
        ++i;
      else if (c == '"')
        inString = false;
    } else if (c == '"') {
      inString = true;
    } else if (c == '[' || c == '{') {
      if (++depth > PacketCodec::maxNestingDepth)
        malformed("nested deeper than " + std::to_string(PacketCodec::maxNestingDepth) + " levels");
    } else if ((c == ']' || c == '}') && depth > 0) {
      --depth;
    }
  }
}

// nlohmann's text starts with e.g. "[json.exception.parse_error.101] "; the rest is worth showing.
// It quotes the offending input raw, which may be anything.
std::string jsonErrorText(const nlohmann::json::exception& error) {
  const std::string_view text = error.what();
  const auto end = text.find("] ");
  return PacketCodec::quotable(end == std::string_view::npos ? text : text.substr(end + 2));
}

// Length of the well-formed UTF-8 sequence starting at text[i], or 0 if there is none.
std::size_t utf8SequenceLength(std::string_view text, std::size_t i) {
  const auto byte = [&](std::size_t k) { return static_cast<unsigned char>(text[k]); };
  const unsigned char lead = byte(i);
  if (lead < 0x80) return 1;
  std::size_t length = 0;
  unsigned char low = 0x80, high = 0xBF;  // range of the second byte; later ones are 80..BF
  if (lead >= 0xC2 && lead <= 0xDF) {
    length = 2;
  } else if (lead >= 0xE0 && lead <= 0xEF) {
    length = 3;
    if (lead == 0xE0) low = 0xA0;   // overlong
    if (lead == 0xED) high = 0x9F;  // surrogates
  } else if (lead >= 0xF0 && lead <= 0xF4) {
    length = 4;
    if (lead == 0xF0) low = 0x90;   // overlong
    if (lead == 0xF4) high = 0x8F;  // beyond U+10FFFF
  } else {
    return 0;
  }
  if (text.size() - i < length) return 0;
  if (byte(i + 1) < low || byte(i + 1) > high) return 0;
  for (std::size_t k = 2; k < length; ++k)
    if (byte(i + k) < 0x80 || byte(i + k) > 0xBF) return 0;
  return length;
}

std::uint64_t unsignedMember(const Json& object, const char* name) {
  const auto it = object.find(name);
  if (it == object.end()) malformed(std::string("no \"") + name + "\" member");
  if (!it->is_number_unsigned()) malformed(std::string("\"") + name + "\" is not an unsigned integer");
  return it->get<std::uint64_t>();
}

}  // namespace

std::string PacketCodec::encode(const JSONPacket& packet, std::uint64_t id,
                                std::optional<std::uint64_t> replyTo) {
  // Assembled by hand so the body is serialised in place instead of being copied into an envelope.
  std::string text = "{\"type\":";
  text += dumpStrict(Json(packet.getType()), "the packet type");
  text += ",\"id\":";
  text += std::to_string(id);
  if (replyTo) {
    text += ",\"replyTo\":";
    text += std::to_string(*replyTo);
  }
  text += ",\"body\":";
  text += dumpStrict(packet.getJson(), "the packet body");
  text += '}';
  return text;
}

std::string PacketCodec::quotable(std::string_view text, std::size_t maxBytes) {
  static constexpr char hex[] = "0123456789ABCDEF";
  std::string result;
  result.reserve(std::min(text.size(), maxBytes) + 3);
  for (std::size_t i = 0; i < text.size();) {
    const auto c = static_cast<unsigned char>(text[i]);
    std::size_t length = utf8SequenceLength(text, i);
    const bool escaped = length == 0 || c < 0x20 || c == 0x7F;
    if (result.size() + (escaped ? 4 : length) > maxBytes) {
      result += "...";
      break;
    }
    if (escaped) {
      result += "\\x";
      result += hex[c >> 4];
      result += hex[c & 0xF];
      length = 1;
    } else {
      result.append(text.substr(i, length));
    }
    i += length;
  }
  return result;
}

PacketEnvelope PacketCodec::decode(std::string_view text) {
  checkNesting(text);
  Json json;
  try {
    json = parseJson(text);
  } catch (const nlohmann::json::exception& error) {
    // Not only parse errors: a number beyond double's range raises out_of_range.
    malformed("not valid JSON: " + jsonErrorText(error));
  }
  if (!json.is_object()) malformed(std::string("a JSON ") + json.type_name() + " instead of an object");

  const auto type = json.find("type");
  if (type == json.end()) malformed("no \"type\" member");
  if (!type->is_string()) malformed("\"type\" is not a string");
  if (type->get_ref<const std::string&>().empty()) malformed("\"type\" is empty");

  const std::uint64_t id = unsignedMember(json, "id");
  std::optional<std::uint64_t> replyTo;
  if (json.contains("replyTo")) replyTo = unsignedMember(json, "replyTo");

  const auto body = json.find("body");
  if (body == json.end()) malformed("no \"body\" member");

  return PacketEnvelope{JSONPacket(std::move(type->get_ref<std::string&>()), std::move(*body)), id, replyTo};
}

}  // namespace qf::zero::io
