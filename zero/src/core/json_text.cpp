#include "qf/zero/core/json_text.h"

#include "qf/zero/core/json_parse.h"
#include "qf/zero/core/messages.h"
#include "qf/zero/core/report_exception.h"

#include <nlohmann/json.hpp>

#include <charconv>
#include <cstdint>
#include <cstring>
#include <iterator>
#include <string>
#include <string_view>
#include <type_traits>
#include <utility>

namespace qf::zero {

namespace {

using Json = nlohmann::ordered_json;

// Spare room a taken text may keep rather than be copied into a buffer of its size.
constexpr std::size_t kKeptSlack = 16;

// True for a string that the compact dump writes as it stands between quotes: printable
// ASCII without a quote or a backslash, which is what most strings of a model are.
bool isPlainAscii(const std::string& text) noexcept {
  // Eight bytes at a time: a byte below 0x20, at or above 0x7f, or equal to '"' or '\\' sets
  // a high bit in `special`. The range tests work on the low seven bits of every byte, where
  // no borrow or carry crosses into the next byte, and a byte at or above 0x80 sets its high
  // bit itself; the tests for a quote and a backslash are the zero-byte test, exact in whether
  // any byte matches.
  constexpr std::uint64_t kOnes = 0x0101010101010101ULL;
  constexpr std::uint64_t kHighs = 0x8080808080808080ULL;
  const auto hasZeroByte = [](std::uint64_t word) { return (word - kOnes) & ~word & kHighs; };
  const auto isPlainWord = [&](std::uint64_t word) {
    const std::uint64_t low7 = word & ~kHighs;
    const std::uint64_t belowSpace = ~((low7 | kHighs) - 0x20 * kOnes);
    const std::uint64_t isDelete = low7 + kOnes;
    const std::uint64_t special = word | belowSpace | isDelete | hasZeroByte(word ^ (0x22 * kOnes)) |
                                  hasZeroByte(word ^ (0x5c * kOnes));
    return (special & kHighs) == 0;
  };
  const std::size_t size = text.size();
  std::uint64_t word = 0x6161616161616161ULL;  // a short text is padded with 'a's
  if (size < 8) {
    std::memcpy(&word, text.data(), size);
    return isPlainWord(word);
  }
  for (std::size_t at = 0; at + 8 <= size; at += 8) {
    std::memcpy(&word, text.data() + at, 8);
    if (!isPlainWord(word)) return false;
  }
  // The last eight bytes, which may overlap the last word read.
  std::memcpy(&word, text.data() + size - 8, 8);
  return isPlainWord(word);
}

void appendString(std::string& out, const std::string& text) {
  if (isPlainAscii(text)) {
    out += '"';
    out += text;
    out += '"';
    return;
  }
  // Escapes, and a text that is not UTF-8, are left to nlohmann's own writer.
  out += Json(text).dump(-1, ' ', false);
}

template <class Integer>
void appendInteger(std::string& out, Integer value) {
  char digits[24];
  const auto end = std::to_chars(std::begin(digits), std::end(digits), value).ptr;
  out.append(digits, end);
}

// value.dump(-1, ' ', false), byte for byte, without nlohmann's character-by-character
// writer for the strings and integers that need no care; floats and the rare kinds are
// written by nlohmann itself.
void appendCompact(std::string& out, const Json& value) {
  switch (value.type()) {
    case Json::value_t::object: {
      out += '{';
      bool first = true;
      for (const auto& [key, member] : value.get_ref<const Json::object_t&>()) {
        if (!first) out += ',';
        first = false;
        appendString(out, key);
        out += ':';
        appendCompact(out, member);
      }
      out += '}';
      return;
    }
    case Json::value_t::array: {
      out += '[';
      bool first = true;
      for (const Json& item : value.get_ref<const Json::array_t&>()) {
        if (!first) out += ',';
        first = false;
        appendCompact(out, item);
      }
      out += ']';
      return;
    }
    case Json::value_t::string:
      appendString(out, value.get_ref<const std::string&>());
      return;
    case Json::value_t::boolean:
      out += value.get<bool>() ? "true" : "false";
      return;
    case Json::value_t::number_integer:
      appendInteger(out, value.get<Json::number_integer_t>());
      return;
    case Json::value_t::number_unsigned:
      appendInteger(out, value.get<Json::number_unsigned_t>());
      return;
    case Json::value_t::null:
      out += "null";
      return;
    default:
      out += value.dump(-1, ' ', false);
      return;
  }
}

template <class Integer>
std::size_t decimalLength(Integer value) {
  std::size_t length = 1;
  if constexpr (std::is_signed_v<Integer>) {
    if (value < 0) {
      ++length;
      // The quotient keeps the sign; its magnitude is what is counted.
      while (value <= -10) {
        value /= 10;
        ++length;
      }
      return length;
    }
  }
  while (value >= 10) {
    value /= 10;
    ++length;
  }
  return length;
}

// The length of the compact text of `value` when none of its strings needs escaping and
// every float takes the longest form it may: the room to reserve, so that the text is
// written without growing and kept without a copy.
std::size_t compactLength(const Json& value) {
  switch (value.type()) {
    case Json::value_t::object: {
      const auto& members = value.get_ref<const Json::object_t&>();
      std::size_t length = members.empty() ? 2 : members.size() + 1;
      for (const auto& [key, member] : members) length += key.size() + 3 + compactLength(member);
      return length;
    }
    case Json::value_t::array: {
      const auto& items = value.get_ref<const Json::array_t&>();
      std::size_t length = items.empty() ? 2 : items.size() + 1;
      for (const Json& item : items) length += compactLength(item);
      return length;
    }
    case Json::value_t::string:
      return value.get_ref<const std::string&>().size() + 2;
    case Json::value_t::boolean:
      return value.get<bool>() ? 4 : 5;
    case Json::value_t::number_integer:
      return decimalLength(value.get<Json::number_integer_t>());
    case Json::value_t::number_unsigned:
      return decimalLength(value.get<Json::number_unsigned_t>());
    case Json::value_t::number_float:
      return 24;
    default:
      return 4;
  }
}

char* writePlainString(char* out, const std::string& text) {
  if (!isPlainAscii(text)) return nullptr;
  *out++ = '"';
  std::memcpy(out, text.data(), text.size());
  out += text.size();
  *out++ = '"';
  return out;
}

template <class Integer>
char* writeInteger(char* out, Integer value) {
  return std::to_chars(out, out + decimalLength(value), value).ptr;
}

// Writes the compact text of `value` from `out` on, into the room compactLength measured,
// and returns where it ends; null, having written some of it, when a string needs escapes
// or a float is met, which appendCompact writes instead.
char* writePlain(char* out, const Json& value) {
  switch (value.type()) {
    case Json::value_t::object: {
      *out++ = '{';
      bool first = true;
      for (const auto& [key, member] : value.get_ref<const Json::object_t&>()) {
        if (!first) *out++ = ',';
        first = false;
        if ((out = writePlainString(out, key)) == nullptr) return nullptr;
        *out++ = ':';
        if ((out = writePlain(out, member)) == nullptr) return nullptr;
      }
      *out++ = '}';
      return out;
    }
    case Json::value_t::array: {
      *out++ = '[';
      bool first = true;
      for (const Json& item : value.get_ref<const Json::array_t&>()) {
        if (!first) *out++ = ',';
        first = false;
        if ((out = writePlain(out, item)) == nullptr) return nullptr;
      }
      *out++ = ']';
      return out;
    }
    case Json::value_t::string:
      return writePlainString(out, value.get_ref<const std::string&>());
    case Json::value_t::boolean: {
      const std::string_view word = value.get<bool>() ? "true" : "false";
      std::memcpy(out, word.data(), word.size());
      return out + word.size();
    }
    case Json::value_t::number_integer:
      return writeInteger(out, value.get<Json::number_integer_t>());
    case Json::value_t::number_unsigned:
      return writeInteger(out, value.get<Json::number_unsigned_t>());
    case Json::value_t::null:
      std::memcpy(out, "null", 4);
      return out + 4;
    default:
      return nullptr;
  }
}

}  // namespace

JsonText::JsonText() : text_("null") {}

JsonText::JsonText(const nlohmann::ordered_json& value) {
  // Most values are written straight into the room measured for them; the rest by
  // appending, which escapes strings and writes floats as the dump does.
  const std::size_t length = compactLength(value);
  text_.resize(length);
  if (const char* end = writePlain(text_.data(), value)) {
    text_.resize(static_cast<std::size_t>(end - text_.data()));
    return;
  }
  text_.clear();
  try {
    appendCompact(text_, value);
  } catch (const nlohmann::json::exception&) {
    reportException(qf0::messages::InvalidValue());
  }
  // A text that needed escapes grew by doubling, and one with floats may not fill its
  // room: a held text keeps only what it needs.
  if (text_.capacity() > text_.size() + kKeptSlack) text_.shrink_to_fit();
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
