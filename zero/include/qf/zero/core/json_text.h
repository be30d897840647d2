// JsonText: a JSON value held as its compact text, for members that keep many JSON
// values and read them rarely (the stored states of a history). The text takes a fraction
// of the memory of the parsed tree; reading parses it.
//
// The text is the compact dump without ASCII escaping, so equal values give
// byte-identical texts and comparing texts compares values; parsing the text gives the
// value back exactly (member order kept, numbers as they were).
#pragma once

#include <nlohmann/json_fwd.hpp>

#include <string>

namespace qf::zero {

// A JSON value kept as its compact text: equal values have equal texts, and parse() gives the
// value back exactly.
class JsonText {
 public:
  // Holds null.
  JsonText();
  // Raises "InvalidValue" when a string in `value` is not valid UTF-8: such a value has no text.
  JsonText(const nlohmann::ordered_json& value);  // NOLINT: converts implicitly, as a member type must
  // Takes `text` unchecked as the compact text of a value: the caller vouches that it is
  // exactly what the value's compact dump gives (a serializer's text writer writes so).
  static JsonText fromCompactText(std::string text) noexcept;

  nlohmann::ordered_json parse() const;
  const std::string& text() const noexcept { return text_; }

  friend bool operator==(const JsonText& a, const JsonText& b) noexcept { return a.text_ == b.text_; }

 private:
  std::string text_;
};

}  // namespace qf::zero
