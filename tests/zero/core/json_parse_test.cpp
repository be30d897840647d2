// parseJson gives what nlohmann's parse gives: on seeded random texts (repeated keys, deep
// nesting, every kind of number, whitespace) the same document, member order included; on
// broken texts the same exception with the same message.
#include "qf/zero/core/json_parse.h"

#include <gtest/gtest.h>

#include <nlohmann/json.hpp>

#include <random>
#include <string>

namespace qf::zero {
namespace {

using nlohmann::ordered_json;

class RandomText {
 public:
  explicit RandomText(unsigned seed) : random_(seed) {}

  std::string value(int depth) {
    switch (depth > 4 ? pick(6) : pick(9)) {
      case 0:
        return pick(2) == 0 ? "null" : "true";
      case 1:
        return std::to_string(pick(2001) - 1000);
      case 2: {
        static const char* const numbers[] = {"0",
                                              "-0",
                                              "-0.0",
                                              "1e3",
                                              "2.5E-3",
                                              "18446744073709551615",
                                              "18446744073709551616",
                                              "-9223372036854775808",
                                              "-9223372036854775809",
                                              "0.1"};
        return numbers[pick(10)];
      }
      case 3: {
        static const char* const strings[] = {"\"\"",
                                              "\"a\"",
                                              "\"Gr\\u00fc\xc3\x9f"
                                              "e\"",
                                              "\"line\\nbreak\"",
                                              "\"\\ud83d\\ude00\"",
                                              "\"\xe6\x97\xa5\""};
        return strings[pick(6)];
      }
      case 4:
      case 5: {
        std::string text = "[";
        for (int i = pick(5); i > 0; --i) text += value(depth + 1) + (i > 1 ? "," : "");
        return text + space() + "]";
      }
      default: {
        // Few key names, so that keys repeat within an object.
        std::string text = "{";
        for (int i = pick(7); i > 0; --i) {
          text +=
              space() + "\"k" + std::to_string(pick(4)) + "\"" + space() + ":" + space() + value(depth + 1);
          if (i > 1) text += ",";
        }
        return text + "}";
      }
    }
  }

 private:
  int pick(int n) { return std::uniform_int_distribution<int>(0, n - 1)(random_); }
  std::string space() { return pick(4) == 0 ? " \n\t" : ""; }

  std::mt19937 random_;
};

class ParseJsonLikeNlohmann : public ::testing::TestWithParam<unsigned> {};

TEST_P(ParseJsonLikeNlohmann, GivesTheSameDocumentWithItsMemberOrder) {
  RandomText texts(GetParam());
  for (int i = 0; i < 200; ++i) {
    const std::string text = texts.value(0);
    const ordered_json expected = ordered_json::parse(text);
    const ordered_json parsed = parseJson(text);
    ASSERT_EQ(parsed, expected) << text;
    ASSERT_EQ(parsed.dump(), expected.dump()) << text;
  }
}

INSTANTIATE_TEST_SUITE_P(Seeds, ParseJsonLikeNlohmann, ::testing::Range(1u, 41u));

class ParseJsonFault : public ::testing::TestWithParam<std::string> {};

TEST_P(ParseJsonFault, RaisesWhatNlohmannRaises) {
  const std::string& text = GetParam();
  std::string expected;
  try {
    [[maybe_unused]] const ordered_json accepted = ordered_json::parse(text);
    FAIL() << "nlohmann accepts " << text;
  } catch (const nlohmann::json::exception& error) {
    expected = std::string(typeid(error).name()) + ": " + error.what();
  }
  try {
    [[maybe_unused]] const ordered_json accepted = parseJson(text);
    FAIL() << "accepted " << text;
  } catch (const nlohmann::json::exception& error) {
    EXPECT_EQ(std::string(typeid(error).name()) + ": " + error.what(), expected);
  }
}

INSTANTIATE_TEST_SUITE_P(Texts, ParseJsonFault,
                         ::testing::Values("", "{", "[1,]", "{\"a\" 1}", "{\"a\":1}x", "1e400", "-1e400",
                                           "\"\xff\"", "\"\\ud800\"", "[[[[", "{\"a\":[1,{\"b\":}]}", "nul"));

}  // namespace
}  // namespace qf::zero
