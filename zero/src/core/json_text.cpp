#include "qf/zero/core/json_text.h"

#include "qf/zero/core/json_parse.h"
#include "qf/zero/core/messages.h"
#include "qf/zero/core/report_exception.h"

#include <nlohmann/json.hpp>

#include <utility>

namespace qf::zero {

JsonText::JsonText() : text_("null") {}

JsonText::JsonText(const nlohmann::ordered_json& value) {
  try {
    text_ = value.dump(-1, ' ', false);
  } catch (const nlohmann::json::exception&) {
    reportException(qf0::messages::InvalidValue());
  }
  // A dump grows its buffer by doubling: a held text keeps only what it needs.
  text_.shrink_to_fit();
}

JsonText JsonText::fromCompactText(std::string text) noexcept {
  JsonText result;
  result.text_ = std::move(text);
  result.text_.shrink_to_fit();
  return result;
}

nlohmann::ordered_json JsonText::parse() const { return parseJson(text_); }

}  // namespace qf::zero
