#include "qf/zero/core/text.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <memory>
#include <random>
#include <string>
#include <string_view>

namespace {

using qf::zero::toUtf16;
using qf::zero::toUtf8;

// Builds a narrow string from raw bytes, so malformed UTF-8 can be written down exactly.
template <class... Bytes>
std::string bytes(Bytes... b) {
  return std::string{static_cast<char>(b)...};
}

std::u16string replacements(std::size_t n) { return std::u16string(n, u'\uFFFD'); }

TEST(Text, WellFormedTextConvertsBothWays) {
  struct Case {
    std::string utf8;
    std::u16string utf16;
  };
  const Case cases[] = {
      {"", u""},
      {"plain ASCII \x01\x7f", u"plain ASCII \x01\x7f"},
      {std::string("nul\0inside", 10), std::u16string(u"nul\0inside", 10)},
      {bytes(0xC2, 0x80), u"\u0080"},                                           // smallest two-byte
      {"\xC3\xA9t\xC3\xA9", u"\u00e9t\u00e9"},                                  // é
      {bytes(0xDF, 0xBF), u"\u07FF"},                                           // largest two-byte
      {bytes(0xE0, 0xA0, 0x80), u"\u0800"},                                     // smallest three-byte
      {"\xE2\x82\xAC", u"\u20AC"},                                              // €
      {bytes(0xED, 0x9F, 0xBF), u"\uD7FF"},                                     // just below the surrogates
      {bytes(0xEE, 0x80, 0x80), u"\uE000"},                                     // just above them
      {bytes(0xEF, 0xBF, 0xBF), u"\uFFFF"},                                     // largest BMP
      {bytes(0xF0, 0x90, 0x80, 0x80), u"\U00010000"},                           // smallest astral
      {"\xF0\x9F\x98\x80 ok", u"\U0001F600 ok"},                                // 😀
      {bytes(0xF4, 0x8F, 0xBF, 0xBF), u"\U0010FFFF"},                           // largest code point
      {"a\xC3\xA9\xE2\x82\xAC\xF0\x9F\x98\x80z", u"a\u00e9\u20AC\U0001F600z"},  // mixed lengths
  };
  for (const Case& c : cases) {
    EXPECT_EQ(toUtf16(c.utf8), c.utf16) << c.utf8;
    EXPECT_EQ(toUtf8(c.utf16), c.utf8) << c.utf8;
  }
}

TEST(Text, EveryCodePointRoundTrips) {
  for (char32_t cp = 0; cp <= 0x10FFFF; ++cp) {
    if (cp >= 0xD800 && cp <= 0xDFFF) continue;
    std::u16string utf16;
    if (cp < 0x10000) {
      utf16 += static_cast<char16_t>(cp);
    } else {
      utf16 += static_cast<char16_t>(0xD800 + ((cp - 0x10000) >> 10));
      utf16 += static_cast<char16_t>(0xDC00 + ((cp - 0x10000) & 0x3FF));
    }
    const std::string utf8 = toUtf8(utf16);
    const std::size_t expectedLength = cp < 0x80 ? 1 : cp < 0x800 ? 2 : cp < 0x10000 ? 3 : 4;
    ASSERT_EQ(utf8.size(), expectedLength) << std::hex << static_cast<std::uint32_t>(cp);
    ASSERT_EQ(toUtf16(utf8), utf16) << std::hex << static_cast<std::uint32_t>(cp);
  }
}

// One U+FFFD per maximal ill-formed subsequence; the byte that broke a sequence starts the next.
TEST(Text, MalformedUtf8BecomesReplacementCharacters) {
  struct Case {
    const char* what;
    std::string utf8;
    std::u16string utf16;
  };
  const std::u16string fffd = replacements(1);
  const Case cases[] = {
      {"lone continuation", bytes(0x80), fffd},
      {"continuations", bytes('a', 0x80, 0xBF, 'b'), u"a" + replacements(2) + u"b"},
      {"never valid lead bytes", bytes(0xC0, 0xC1, 0xF5, 0xFF), replacements(4)},
      {"overlong slash", bytes(0xC0, 0xAF), replacements(2)},
      {"overlong three-byte", bytes(0xE0, 0x80, 0xAF), replacements(3)},
      {"overlong four-byte", bytes(0xF0, 0x80, 0x80, 0xAF), replacements(4)},
      {"encoded surrogate", bytes(0xED, 0xA0, 0x80), replacements(3)},
      {"above U+10FFFF", bytes(0xF4, 0x90, 0x80, 0x80), replacements(4)},
      {"truncated two-byte at end", bytes('x', 0xC3), u"x" + fffd},
      {"truncated three-byte at end", bytes(0xE2, 0x82), fffd},
      {"truncated four-byte at end", bytes(0xF0, 0x9F, 0x98), fffd},
      {"truncated before ASCII", bytes(0xE2, 0x82, 'A'), fffd + u"A"},
      {"truncated before a new sequence", bytes(0xF0, 0x9F, 0xC3, 0xA9), fffd + u"\u00e9"},
      {"bad second byte", bytes(0xE2, '(', 0xA1), fffd + u"(" + fffd},
      {"lead byte alone before lead byte", bytes(0xC3, 0xC3, 0xA9), fffd + u"\u00e9"},
  };
  for (const Case& c : cases) EXPECT_EQ(toUtf16(c.utf8), c.utf16) << c.what;
}

TEST(Text, UnpairedSurrogatesBecomeReplacementCharacters) {
  struct Case {
    const char* what;
    std::u16string utf16;
    std::string utf8;
  };
  const std::string fffd = "\xEF\xBF\xBD";
  const Case cases[] = {
      {"high at end", u"a\xD83D", "a" + fffd},
      {"high before ASCII", u"\xD83Dz", fffd + "z"},
      {"high before high and low", u"\xD83D\xD83D\xDE00", fffd + "\xF0\x9F\x98\x80"},
      {"lone low", u"\xDE00", fffd},
      {"reversed pair", u"\xDE00\xD83D", fffd + fffd},
  };
  for (const Case& c : cases) EXPECT_EQ(toUtf8(c.utf16), c.utf8) << c.what;
}

// The input is a view: its end is where the text stops, whatever the storage holds after it.
TEST(Text, ViewsEndingInsideASequenceStopThere) {
  const std::string euro = "\xE2\x82\xAC";
  EXPECT_EQ(toUtf16(std::string_view(euro).substr(0, 2)), replacements(1));
  EXPECT_EQ(toUtf16(std::string_view(euro).substr(0, 1)), replacements(1));
  const std::u16string grin = u"\U0001F600";
  EXPECT_EQ(toUtf8(std::u16string_view(grin).substr(0, 1)), "\xEF\xBF\xBD");
}

// Arbitrary input never faults (run under the address sanitizer to see reads out of bounds) and
// always yields well-formed output, which then survives a round trip unchanged.
TEST(Text, ArbitraryInputYieldsWellFormedOutput) {
  const std::uint32_t seed = 20240611;
  std::mt19937 random(seed);
  std::uniform_int_distribution<int> length(0, 12);
  std::uniform_int_distribution<int> byte(0, 255);
  std::uniform_int_distribution<int> unit(0, 0xFFFF);
  // Bias UTF-16 towards surrogates so that pairs and lone halves both occur often.
  std::uniform_int_distribution<int> surrogate(0xD800, 0xDFFF);
  for (int i = 0; i < 20000; ++i) {
    std::string utf8;
    std::u16string utf16;
    const int n = length(random);
    for (int j = 0; j < n; ++j) {
      utf8 += static_cast<char>(byte(random));
      utf16 += static_cast<char16_t>(j % 2 == 0 ? surrogate(random) : unit(random));
    }
    // Exact-size heap copies, so that the address sanitizer sees any read past the end.
    const auto narrowCopy = std::make_unique<char[]>(utf8.size());
    std::copy(utf8.begin(), utf8.end(), narrowCopy.get());
    const auto wideCopy = std::make_unique<char16_t[]>(utf16.size());
    std::copy(utf16.begin(), utf16.end(), wideCopy.get());

    const std::u16string fromBytes = toUtf16(std::string_view(narrowCopy.get(), utf8.size()));
    ASSERT_EQ(toUtf16(toUtf8(fromBytes)), fromBytes) << "seed " << seed << " iteration " << i;
    const std::string fromUnits = toUtf8(std::u16string_view(wideCopy.get(), utf16.size()));
    ASSERT_EQ(toUtf8(toUtf16(fromUnits)), fromUnits) << "seed " << seed << " iteration " << i;
  }
}

}  // namespace
