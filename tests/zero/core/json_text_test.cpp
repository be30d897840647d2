// JsonText holds a JSON value as its compact text: on seeded random values, the text is the
// value's dump, parsing it gives the value back exactly, and two texts are equal exactly when
// their values are.
#include "qf/zero/core/json_text.h"

#include "qf/zero/core/messages.h"
#include "qf/zero/core/report_exception.h"

#include <gtest/gtest.h>

#include <nlohmann/json.hpp>

#include <cstdint>
#include <limits>
#include <random>
#include <string>

namespace qf::zero {
namespace {

using nlohmann::ordered_json;

ordered_json randomValue(std::mt19937& random, int depth) {
  const auto pick = [&](int n) { return std::uniform_int_distribution<int>(0, n - 1)(random); };
  switch (depth > 2 ? pick(5) : pick(7)) {
    case 0:
      return nullptr;
    case 1:
      return pick(2) == 0;
    case 2: {
      static const ordered_json integers[] = {0, -1, std::numeric_limits<std::int64_t>::min(),
                                              std::numeric_limits<std::int64_t>::max(),
                                              std::numeric_limits<std::uint64_t>::max()};
      return pick(2) == 0 ? ordered_json(pick(2000) - 1000) : integers[pick(5)];
    }
    case 3: {
      static const double floats[] = {0.1, -2.5, 1e300, 5e-324, 1e-7};
      return pick(2) == 0 ? (pick(2000) - 1000) / 7.0 : floats[pick(5)];
    }
    case 4: {
      static const char* const texts[] = {
          "",         "a",        "Grüße",        "line\nbreak", "quote \" and \\", "日本",
          "\x01\x1f", "del \x7f", "\u2028\u2029", "tab\there",   "/slash/",         "\U0001F600"};
      if (pick(2) == 0) return texts[pick(12)];
      // Longer strings of the bytes at the edges of what is written as it stands, so that
      // every position of an eight-byte word meets each of them.
      static const char* const pieces[] = {"\x1f", " ", "!", "\"", "\\", "[", "]", "~", "\x7f", "a", "é"};
      std::string text;
      for (int i = pick(40); i > 0; --i) text += pick(4) == 0 ? pieces[pick(11)] : "a";
      return text;
    }
    case 5: {
      ordered_json array = ordered_json::array();
      for (int i = pick(4); i > 0; --i) array.push_back(randomValue(random, depth + 1));
      return array;
    }
    default: {
      ordered_json object = ordered_json::object();
      for (int i = pick(4); i > 0; --i)
        object["k" + std::to_string(pick(5))] = randomValue(random, depth + 1);
      return object;
    }
  }
}

class JsonTextRoundTrip : public ::testing::TestWithParam<unsigned> {};

TEST_P(JsonTextRoundTrip, ParsingTheTextGivesTheValueAndTextsCompareAsValues) {
  std::mt19937 random(GetParam());
  for (int i = 0; i < 50; ++i) {
    const ordered_json a = randomValue(random, 0);
    const ordered_json b = randomValue(random, 0);
    EXPECT_EQ(JsonText(a).text(), a.dump()) << a.dump();
    EXPECT_EQ(JsonText(a).parse(), a) << a.dump();
    EXPECT_EQ(JsonText(a) == JsonText(b), a == b) << a.dump() << " against " << b.dump();
  }
}

INSTANTIATE_TEST_SUITE_P(Seeds, JsonTextRoundTrip, ::testing::Range(1u, 21u));

TEST(JsonText, HoldsNullByDefaultAndRefusesAStringOrKeyThatIsNotUtf8) {
  EXPECT_EQ(JsonText().parse(), ordered_json(nullptr));
  EXPECT_EQ(JsonText(), JsonText(ordered_json(nullptr)));
  EXPECT_THROW(JsonText(ordered_json{{"name", std::string("\xff\xfe")}}),
               foundation::core::except::Exception<qf0::messages::InvalidValue>);
  EXPECT_THROW(JsonText(ordered_json{{std::string("key \xc3"), 1}}),
               foundation::core::except::Exception<qf0::messages::InvalidValue>);
  EXPECT_THROW(JsonText(ordered_json::array({"plain", std::string("\xed\xa0\x80")})),
               foundation::core::except::Exception<qf0::messages::InvalidValue>);
}

}  // namespace
}  // namespace qf::zero
