// The framework's primitive types: defaults, text forms, identities.
#include "qf/zero/core/meta/framework_package.h"
#include "qf/zero/core/meta/meta_registry.h"

#include <boost/date_time/posix_time/posix_time.hpp>

#include <gtest/gtest.h>

#include <nlohmann/json.hpp>

#include <cctype>
#include <random>
#include <set>

namespace qf::zero {
namespace {

struct TextCase {
  const char16_t* type;
  const char16_t* text;
  bool valid;
};

class PrimitiveText : public ::testing::TestWithParam<TextCase> {};

// A text that parses prints back to itself; one that does not, parses to nothing.
TEST_P(PrimitiveText, ParsesAndPrintsBack) {
  const TextCase& c = GetParam();
  const auto* traits = meta::MetaRegistry::getInstance().getPrimitiveType(c.type)->getTraits();
  ASSERT_NE(traits, nullptr);
  const auto parsed = traits->parseText(c.text);
  ASSERT_EQ(parsed.has_value(), c.valid) << toUtf8(c.type) << " '" << toUtf8(c.text) << "'";
  if (c.valid) {
    EXPECT_EQ(traits->toText(*parsed), c.text);
  }
}

INSTANTIATE_TEST_SUITE_P(
    Table, PrimitiveText,
    ::testing::Values(TextCase{u"String", u"any text", true}, TextCase{u"Boolean", u"true", true},
                      TextCase{u"Boolean", u"yes", false}, TextCase{u"Integer", u"-12", true},
                      TextCase{u"Integer", u"12x", false}, TextCase{u"Integer", u"99999999999", false},
                      TextCase{u"UUID", u"0b2c3d4e-0000-4000-8000-00000000abcd", true},
                      TextCase{u"UUID", u"0b2c3d4e-0000-4000-8000-00000000abc", false},
                      TextCase{u"DateTime", u"2024-02-29T10:30:00", true},
                      TextCase{u"DateTime", u"2024-02-30T10:30:00", false},
                      TextCase{u"JsonValue", u"{\"a\":[1,2]}", true},
                      TextCase{u"JsonValue", u"{\"a\":", false}));

TEST(PrimitiveDefaults, EveryTypeHasAZeroOfItsOwnCppType) {
  auto& registry = meta::MetaRegistry::getInstance();
  EXPECT_EQ(registry.getPrimitiveType(u"String")->getTraits()->defaultValue().getValue<std::u16string>(),
            u"");
  EXPECT_EQ(registry.getPrimitiveType(u"Integer")->getTraits()->defaultValue().getValue<int>(), 0);
  EXPECT_TRUE(registry.getPrimitiveType(u"UUID")->getTraits()->defaultValue().getValue<Uuid>().is_nil());
  EXPECT_TRUE(registry.getPrimitiveType(u"DateTime")
                  ->getTraits()
                  ->defaultValue()
                  .getValue<DateTime>()
                  .is_not_a_date_time());
  EXPECT_TRUE(
      registry.getPrimitiveType(u"JsonValue")->getTraits()->defaultValue().getValue<JsonValue>().is_null());
  EXPECT_FALSE(registry.getPrimitiveType(u"HxArray")->getTraits()->defaultValue().getValue<HxArray>());
}

TEST(Uuids, FreshOnesAreVersionFourAndDistinctNameBasedOnesAreStable) {
  std::set<Uuid> seen;
  for (int i = 0; i < 1000; ++i) {
    const Uuid id = generateNewUuid();
    EXPECT_EQ(id.version(), Uuid::version_random_number_based);
    EXPECT_EQ(id.variant(), Uuid::variant_rfc_4122);
    EXPECT_TRUE(seen.insert(id).second);
  }
  const Uuid ns = generateNewUuid();
  EXPECT_EQ(nameBasedUuid(ns, "kiv.Branch"), nameBasedUuid(ns, "kiv.Branch"));
  EXPECT_NE(nameBasedUuid(ns, "kiv.Branch"), nameBasedUuid(ns, "kiv.Commit"));
  EXPECT_EQ(nameBasedUuid(ns, "x").version(), Uuid::version_name_based_md5);
  const Uuid id = generateNewUuid();
  EXPECT_EQ(parseUuid(toText(id)), id);
  EXPECT_EQ(parseUuid("{" + toText(id) + "}"), id);
  EXPECT_FALSE(parseUuid("0b2c3d4e-0000-4000-8000-00000000abcg"));
  EXPECT_FALSE(parseUuid(""));
}

// On seeded random UUIDs: the text of a UUID parses back to it in either case, as UTF-8
// and as UTF-16, and any one character replaced by a character out of place (a dash for a
// digit, a digit for a dash, a letter beyond f, a UTF-16 unit whose low byte is a digit) is
// refused.
TEST(Uuids, ParseTakesExactlyTheCanonicalForm) {
  std::mt19937 random(7);
  for (int i = 0; i < 500; ++i) {
    const Uuid id = generateNewUuid();
    std::string text = toText(id);
    ASSERT_EQ(parseUuid(text), id) << text;
    ASSERT_EQ(parseUuid(toUtf16(text)), id) << text;
    ASSERT_EQ(parseUuid(toUtf16("{" + text + "}")), id) << text;
    std::string upper = text;
    for (char& c : upper) c = static_cast<char>(std::toupper(static_cast<unsigned char>(c)));
    ASSERT_EQ(parseUuid(upper), id) << upper;
    const auto at = std::uniform_int_distribution<std::size_t>(0, text.size() - 1)(random);
    std::u16string wide = toUtf16(text);
    wide[at] = static_cast<char16_t>(0x0100 | static_cast<unsigned char>(text[at]));
    EXPECT_FALSE(parseUuid(wide)) << text << " with a wide unit at " << at;
    EXPECT_FALSE(parseUuid(toUtf16(text) + u"0")) << "too long";
    text[at] = text[at] == '-' ? 'a' : (i % 2 == 0 ? '-' : 'g');
    EXPECT_FALSE(parseUuid(text)) << text;
    EXPECT_FALSE(parseUuid(toUtf16(text))) << text;
    EXPECT_FALSE(parseUuid(text.substr(1))) << "too short";
  }
}

}  // namespace
}  // namespace qf::zero
