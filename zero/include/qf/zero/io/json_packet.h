#pragma once

#include <nlohmann/json.hpp>

#include <string>
#include <utility>

namespace qf::zero::io {

// One message between two peers: a type naming what it is ("Pull", "OK", "Error", ...) and a JSON
// body whose layout that type defines. The type is free text, interpreted only by the handlers a
// PacketTransport dispatches to. A plain value: copy and move freely.
class JSONPacket {
 public:
  JSONPacket(std::string type, nlohmann::ordered_json json)
      : type_(std::move(type)), json_(std::move(json)) {}

  const std::string& getType() const noexcept { return type_; }
  const nlohmann::ordered_json& getJson() const noexcept { return json_; }

  // For a receiver that wants to keep the body without copying it.
  nlohmann::ordered_json takeJson() && noexcept { return std::move(json_); }

 private:
  std::string type_;
  nlohmann::ordered_json json_;
};

}  // namespace qf::zero::io
