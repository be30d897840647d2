// JsonText holds a JSON value as its compact text: on seeded random values, the text is the
// value's dump, parsing it gives the value back exactly, and two texts are equal exactly when
// their values are.
#include "qf/zero/core/json_text.h"

#include "qf/zero/core/messages.h"
#include "qf/zero/core/report_exception.h"
#include "support/json_documents.h"

#include <gtest/gtest.h>

#include <nlohmann/json.hpp>

#include <cstdint>
#include <limits>
#include <random>
#include <string>

namespace qf::zero {
namespace {

using nlohmann::ordered_json;

class JsonTextRoundTrip : public ::testing::TestWithParam<unsigned> {};

TEST_P(JsonTextRoundTrip, ParsingTheTextGivesTheValueAndTextsCompareAsValues) {
  std::mt19937 random(GetParam());
  for (int i = 0; i < 50; ++i) {
    const ordered_json a = support::randomJsonValue(random);
    const ordered_json b = support::randomJsonValue(random);
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
