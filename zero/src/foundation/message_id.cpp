#include "foundation/core/except/message_id.h"

#include "foundation/core/text/utf.h"

#include <cstddef>
#include <string>
#include <type_traits>
#include <utility>
#include <variant>

namespace foundation::core::except {

MessageId::MessageId(const Catalog& catalog, std::string_view key, std::vector<MessageArgument> arguments)
    : catalog_(&catalog), catalogName_(catalog.name()), key_(key), arguments_(std::move(arguments)) {}

MessageId::MessageId(std::string catalogName, std::string key, std::vector<MessageArgument> arguments)
    : catalog_(nullptr),
      catalogName_(std::move(catalogName)),
      key_(std::move(key)),
      arguments_(std::move(arguments)) {}

std::string argumentText(const MessageArgument& argument) {
  return std::visit(
      [](const auto& value) -> std::string {
        using T = std::decay_t<decltype(value)>;
        if constexpr (std::is_same_v<T, std::string>)
          return value;
        else if constexpr (std::is_same_v<T, std::u16string>)
          return foundation::core::text::toUtf8(value);
        else
          return std::to_string(value);
      },
      argument);
}

namespace {

// Recognises "{n}" at text[pos] with n a decimal number of at most 9 digits (larger numbers can
// never name an argument and must not overflow). Returns the length of the placeholder and sets
// index, or returns 0 when there is no placeholder at pos.
std::size_t placeholderAt(std::string_view text, std::size_t pos, std::size_t& index) {
  constexpr std::size_t maxDigits = 9;
  if (text[pos] != '{') return 0;
  std::size_t end = pos + 1;
  std::size_t value = 0;
  while (end < text.size() && text[end] >= '0' && text[end] <= '9' && end - pos <= maxDigits) {
    value = value * 10 + static_cast<std::size_t>(text[end] - '0');
    ++end;
  }
  if (end == pos + 1 || end >= text.size() || text[end] != '}') return 0;
  index = value;
  return end + 1 - pos;
}

}  // namespace

std::string MessageId::render() const {
  const std::optional<std::string_view> text = catalog_ != nullptr ? catalog_->textOf(key_) : std::nullopt;
  std::string result;
  if (!text) {
    result = toString();
    if (!arguments_.empty()) {
      result += '(';
      for (std::size_t i = 0; i < arguments_.size(); ++i) {
        if (i != 0) result += ", ";
        result += argumentText(arguments_[i]);
      }
      result += ')';
    }
    return result;
  }
  result.reserve(text->size());
  std::size_t pos = 0;
  while (pos < text->size()) {
    std::size_t index = 0;
    const std::size_t length = placeholderAt(*text, pos, index);
    if (length != 0 && index >= 1 && index <= arguments_.size()) {
      result += argumentText(arguments_[index - 1]);
      pos += length;
    } else {
      result += (*text)[pos];
      ++pos;
    }
  }
  return result;
}

std::string MessageId::toString() const {
  std::string result;
  result.reserve(catalogName_.size() + 1 + key_.size());
  result += catalogName_;
  result += '/';
  result += key_;
  return result;
}

bool operator==(const MessageId& lhs, const MessageId& rhs) {
  return lhs.catalogName_ == rhs.catalogName_ && lhs.key_ == rhs.key_ && lhs.arguments_ == rhs.arguments_;
}

}  // namespace foundation::core::except
