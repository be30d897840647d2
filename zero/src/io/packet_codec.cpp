#include "qf/zero/io/packet_codec.h"

#include "qf/zero/core/messages.h"
#include "qf/zero/core/report_exception.h"

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

// nlohmann's text starts with "[json.exception.parse_error.101] "; the rest is worth showing.
std::string parseErrorText(const nlohmann::json::parse_error& error) {
  std::string text = error.what();
  const auto end = text.find("] ");
  return end == std::string::npos ? text : text.substr(end + 2);
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

PacketEnvelope PacketCodec::decode(std::string_view text) {
  checkNesting(text);
  Json json;
  try {
    json = Json::parse(text);
  } catch (const nlohmann::json::parse_error& error) {
    malformed("not valid JSON: " + parseErrorText(error));
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
