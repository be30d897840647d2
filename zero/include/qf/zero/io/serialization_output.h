// SerializationOutput: where a serializer writes.
#pragma once

#include <nlohmann/json_fwd.hpp>

#include <string>

namespace qf::zero::io {

// Where a serializer writes: a JSON value or a text the caller owns, which must outlive the
// serialization.
class SerializationOutput {
 public:
  // Into an nlohmann::ordered_json held by the caller (`json` points at one), with no
  // text in between: the form used when the document is kept or sent as a value.
  static SerializationOutput forIntermediateFormat(void* json) {
    return SerializationOutput(static_cast<nlohmann::ordered_json*>(json), nullptr);
  }
  // As compact UTF-8 text.
  static SerializationOutput forText(std::string* text) { return SerializationOutput(nullptr, text); }

  nlohmann::ordered_json* getJson() const noexcept { return json_; }
  std::string* getText() const noexcept { return text_; }

 private:
  SerializationOutput(nlohmann::ordered_json* json, std::string* text) : json_(json), text_(text) {}
  nlohmann::ordered_json* json_;
  std::string* text_;
};

}  // namespace qf::zero::io
