#include "foundation/core/text/utf.h"

#include <cstddef>
#include <cstdint>

namespace foundation::core::text {

namespace {

constexpr char32_t replacementCharacter = 0xFFFD;

bool isHighSurrogate(char32_t unit) { return unit >= 0xD800 && unit <= 0xDBFF; }
bool isLowSurrogate(char32_t unit) { return unit >= 0xDC00 && unit <= 0xDFFF; }

// Writes `cp` as UTF-8 at `at` and returns the end of what it wrote (at most four bytes).
char* putUtf8(char* at, char32_t cp) {
  if (cp < 0x80) {
    *at++ = static_cast<char>(cp);
  } else if (cp < 0x800) {
    *at++ = static_cast<char>(0xC0 | (cp >> 6));
    *at++ = static_cast<char>(0x80 | (cp & 0x3F));
  } else if (cp < 0x10000) {
    *at++ = static_cast<char>(0xE0 | (cp >> 12));
    *at++ = static_cast<char>(0x80 | ((cp >> 6) & 0x3F));
    *at++ = static_cast<char>(0x80 | (cp & 0x3F));
  } else {
    *at++ = static_cast<char>(0xF0 | (cp >> 18));
    *at++ = static_cast<char>(0x80 | ((cp >> 12) & 0x3F));
    *at++ = static_cast<char>(0x80 | ((cp >> 6) & 0x3F));
    *at++ = static_cast<char>(0x80 | (cp & 0x3F));
  }
  return at;
}

void appendUtf16(std::u16string& out, char32_t cp) {
  if (cp < 0x10000) {
    out += static_cast<char16_t>(cp);
  } else {
    cp -= 0x10000;
    out += static_cast<char16_t>(0xD800 + (cp >> 10));
    out += static_cast<char16_t>(0xDC00 + (cp & 0x3FF));
  }
}

// Decodes one code point of well-formed UTF-8 starting at text[pos] and advances pos. On an
// ill-formed sequence yields U+FFFD and advances past its maximal valid prefix (at least one
// byte), so the offending byte starts the next sequence. The allowed range of the second byte
// excludes overlongs (E0, F0), surrogates (ED) and code points above U+10FFFF (F4).
char32_t decodeUtf8(std::string_view text, std::size_t& pos) {
  const auto byte = [&](std::size_t i) { return static_cast<std::uint8_t>(text[i]); };
  const std::uint8_t lead = byte(pos);
  if (lead < 0x80) {
    ++pos;
    return lead;
  }
  std::size_t length = 0;
  std::uint8_t low = 0x80;
  std::uint8_t high = 0xBF;
  char32_t cp = 0;
  if (lead >= 0xC2 && lead <= 0xDF) {
    length = 2;
    cp = lead & 0x1F;
  } else if (lead >= 0xE0 && lead <= 0xEF) {
    length = 3;
    cp = lead & 0x0F;
    if (lead == 0xE0) low = 0xA0;
    if (lead == 0xED) high = 0x9F;
  } else if (lead >= 0xF0 && lead <= 0xF4) {
    length = 4;
    cp = lead & 0x07;
    if (lead == 0xF0) low = 0x90;
    if (lead == 0xF4) high = 0x8F;
  } else {
    ++pos;
    return replacementCharacter;
  }
  std::size_t i = 1;
  for (; i < length; ++i) {
    if (pos + i >= text.size()) break;
    const std::uint8_t next = byte(pos + i);
    if (next < low || next > high) break;
    cp = (cp << 6) | (next & 0x3F);
    low = 0x80;
    high = 0xBF;
  }
  pos += i;
  return i == length ? cp : replacementCharacter;
}

// The length of toUtf8(text): one to three bytes a code unit, four a surrogate pair, three a
// lone surrogate (its replacement character).
std::size_t utf8Length(std::u16string_view text) {
  std::size_t length = 0;
  for (std::size_t pos = 0; pos < text.size(); ++pos) {
    const char32_t unit = text[pos];
    if (unit < 0x80) {
      length += 1;
    } else if (unit < 0x800) {
      length += 2;
    } else if (isHighSurrogate(unit) && pos + 1 < text.size() && isLowSurrogate(text[pos + 1])) {
      length += 4;
      ++pos;
    } else {
      length += 3;
    }
  }
  return length;
}

}  // namespace

// Writes into room made up front, exactly as much as the text needs.
void appendUtf8(std::string& out, std::u16string_view text) {
  const std::size_t start = out.size();
  out.resize(start + utf8Length(text));
  char* at = out.data() + start;
  for (std::size_t pos = 0; pos < text.size(); ++pos) {
    const char32_t unit = text[pos];
    if (unit < 0x80) {
      *at++ = static_cast<char>(unit);
    } else if (isHighSurrogate(unit) && pos + 1 < text.size() && isLowSurrogate(text[pos + 1])) {
      at = putUtf8(at, 0x10000 + ((unit - 0xD800) << 10) + (text[pos + 1] - 0xDC00));
      ++pos;
    } else if (isHighSurrogate(unit) || isLowSurrogate(unit)) {
      at = putUtf8(at, replacementCharacter);
    } else {
      at = putUtf8(at, unit);
    }
  }
}

std::string toUtf8(std::u16string_view text) {
  std::string out;
  appendUtf8(out, text);
  return out;
}

std::u16string toUtf16(std::string_view text) {
  // A text has at most as many UTF-16 units as bytes. Its ASCII start, which for most texts
  // is all of it, is widened as it stands.
  std::u16string out(text.size(), u'\0');
  std::size_t pos = 0;
  for (; pos < text.size() && static_cast<unsigned char>(text[pos]) < 0x80; ++pos) out[pos] = text[pos];
  if (pos == text.size()) return out;
  out.resize(pos);
  while (pos < text.size()) appendUtf16(out, decodeUtf8(text, pos));
  return out;
}

}  // namespace foundation::core::text
