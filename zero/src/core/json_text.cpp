#include "qf/zero/core/json_text.h"

#include "qf/zero/core/json_parse.h"
#include "qf/zero/core/messages.h"
#include "qf/zero/core/report_exception.h"

#include <nlohmann/json.hpp>

#include <utility>

namespace qf::zero {

namespace {

// Spare room a taken text may keep rather than be copied into a buffer of its size.
constexpr std::size_t kKeptSlack = 16;

}  // namespace

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
  // Text written into room reserved for it is kept as it is; a buffer that grew by
  // doubling keeps only what it needs.
  if (result.text_.capacity() > result.text_.size() + kKeptSlack) result.text_.shrink_to_fit();
  return result;
}

nlohmann::ordered_json JsonText::parse() const { return parseJson(text_); }

}  // namespace qf::zero
