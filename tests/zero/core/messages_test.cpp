#include "qf/zero/core/messages.h"

#include "foundation/core/except/catalog.h"
#include "foundation/core/except/exception.h"
#include "foundation/core/except/message.h"
#include "foundation/core/except/message_id.h"
#include "qf/zero/core/report_exception.h"
#include "qf/zero/core/text.h"
#include "support/message_catalog_checks.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <limits>
#include <memory>
#include <stdexcept>
#include <string>
#include <string_view>
#include <type_traits>
#include <vector>

namespace {

namespace except = foundation::core::except;
using support::messageRow;
namespace msg = qf0::messages;

TEST(Qf0Messages, EveryKeyHasATextAndAClassWhoseArgumentsFillItsPlaceholders) {
  // Non-ASCII and astral samples check that wide arguments reach the text as UTF-8.
  const std::vector<support::MessageRow> rows = {
      messageRow<msg::CannotAddIncompatibleTypes>(u"Wïdget", u"G\u00e4dget"),
      messageRow<msg::CannotAddNonExistentObject>(),
      messageRow<msg::CannotAddSecondObject>(),
      messageRow<msg::CannotCastIncompatibleTypes>(u"Sp\U0001D4AEcial"),
      messageRow<msg::CannotCreateCrossModelAssociation>(),
      messageRow<msg::CannotCreateWithoutModel>(),
      messageRow<msg::CannotModifyProxy>(),
      messageRow<msg::CannotSetReadOnlyProperty>("Widget.name"),
      messageRow<msg::InvalidValue>(),
      messageRow<msg::NoSuchProperty>(u"Widget", u"colour"),
      messageRow<msg::NoSuchType>(u"UUID"),
      messageRow<msg::UniquenessConstraint>(),
      messageRow<msg::CannotCreateCircularContainment>(),
      messageRow<msg::CannotModifyDestroyedElement>(),
      messageRow<msg::CannotModifyFrozenModel>(),
      messageRow<msg::CannotSetSetOnceProperty>(u"Widget.id"),
      messageRow<msg::CannotInstantiateAbstractClass>(u"Shape"),
      messageRow<msg::DuplicateElementId>("0b2c5a9e-3f1d-4c2b-9a8e-7d6c5b4a3f21"),
      messageRow<msg::NoSuchClass>(u"geo.Shape"),
      messageRow<msg::NoSuchOperation>(u"Widget", u"spin"),
      messageRow<msg::NotImplemented>(u"shop.Widget.spin"),
      messageRow<msg::ElementRequired>(u"shop.Widget.attach"),
      messageRow<msg::WrongArgumentCount>(u"spin", 2, 3),
      messageRow<msg::IndexOutOfRange>(17, 4),
      messageRow<msg::TransactionNotOpen>(),
      messageRow<msg::TransactionAborted>(),
      messageRow<msg::CannotResolveProxy>("9f8e7d6c-5b4a-4321-8fed-cba987654321"),
      messageRow<msg::TypeAlreadyRegistered>(u"geo.Point"),
      messageRow<msg::ModelDestroyed>(),
      messageRow<msg::MalformedDocument>("entries must be an array"),
      messageRow<msg::UnsupportedFormatVersion>("2.0"),
      messageRow<msg::WrongJsonType>(u"Widget.size", "a number", "a string"),
      messageRow<msg::DanglingReference>(u"Widget.owner", "9f8e7d6c-5b4a-4321-8fed-cba987654321"),
      messageRow<msg::ChannelClosed>("the peer went away"),
      messageRow<msg::ExchangeFailed>("History", "the channel closed"),
      messageRow<msg::MalformedPacket>("no type member"),
      messageRow<msg::PacketTooLarge>(2000000, 1048576),
      messageRow<msg::UnknownPacketType>("Gossip"),
      messageRow<msg::PacketHandlerFailed>("Pull", "vector::_M_range_check"),
      messageRow<msg::ConnectionFailed>("127.0.0.1:9", "connection refused"),
      messageRow<msg::ListenFailed>("127.0.0.1:80", "address in use"),
      messageRow<msg::CannotCreateTransportWithoutChannel>(),
      messageRow<msg::ChannelAlreadyStarted>(),
  };
  EXPECT_EQ(msg::catalog().name(), "qf0:messages");
  support::checkCatalog(msg::catalog(), rows);
}

// ---------------------------------------------------------------------------------------------
// Constructing messages.

static_assert(std::is_constructible_v<msg::NoSuchType, std::u16string_view>);
static_assert(std::is_constructible_v<msg::NoSuchType, const std::u16string&>);
static_assert(!std::is_constructible_v<msg::NoSuchType, const char*>,
              "a wide argument must not take narrow text");
static_assert(!std::is_convertible_v<const char16_t*, msg::NoSuchType>, "message constructors are explicit");
static_assert(std::is_constructible_v<msg::DuplicateElementId, std::string_view>);
static_assert(!std::is_constructible_v<msg::DuplicateElementId, const char16_t*>);
static_assert(!std::is_constructible_v<msg::IndexOutOfRange, bool, bool>, "bool is not a number");
static_assert(!std::is_constructible_v<msg::IndexOutOfRange, char, char>, "char is not a number");
static_assert(std::is_default_constructible_v<msg::ModelDestroyed>);
static_assert(!std::is_constructible_v<msg::ModelDestroyed, int>);
static_assert(std::is_final_v<msg::NoSuchType> && std::is_base_of_v<except::Message, msg::NoSuchType>);
static_assert(std::is_nothrow_copy_constructible_v<except::Exception<msg::NoSuchType>>,
              "copying an exception while it is thrown must not throw");

TEST(MessageArguments, KeepTheWidthTheyWereGivenIn) {
  const std::u16string wide = u"Widget";
  const std::string narrow = "Widget";
  const std::vector<except::MessageArgument> narrowOnly{std::string("Widget")};
  const std::vector<except::MessageArgument> wideOnly{std::u16string(u"Widget")};

  EXPECT_EQ(msg::CannotCastIncompatibleTypes(u"Widget").id().arguments(), wideOnly);
  EXPECT_EQ(msg::CannotCastIncompatibleTypes(wide).id().arguments(), wideOnly);
  EXPECT_EQ(msg::CannotCastIncompatibleTypes(std::u16string_view(wide)).id().arguments(), wideOnly);
  EXPECT_EQ(msg::CannotCastIncompatibleTypes("Widget").id().arguments(), narrowOnly);
  EXPECT_EQ(msg::CannotCastIncompatibleTypes(narrow).id().arguments(), narrowOnly);
  EXPECT_EQ(msg::CannotCastIncompatibleTypes(std::string_view(narrow)).id().arguments(), narrowOnly);
  EXPECT_EQ(msg::CannotCastIncompatibleTypes(except::MessageArgument(wide)).id().arguments(), wideOnly);

  // Same text in different widths is a different argument.
  EXPECT_NE(msg::CannotCastIncompatibleTypes(u"Widget").id(),
            msg::CannotCastIncompatibleTypes("Widget").id());
}

TEST(MessageArguments, AcceptEveryIntegralTypeAndKeepOutOfRangeValuesExact) {
  const std::size_t size = 4;
  const unsigned short index = 9;
  const auto id = msg::IndexOutOfRange(index, size).id();
  EXPECT_EQ(id.arguments(), (std::vector<except::MessageArgument>{std::int64_t{9}, std::int64_t{4}}));

  const std::int64_t lowest = std::numeric_limits<std::int64_t>::min();
  EXPECT_EQ(msg::IndexOutOfRange(lowest, -1).id().render(),
            "The index -9223372036854775808 is out of range for size -1.");

  // Beyond int64: not wrapped to a negative number.
  const std::uint64_t huge = std::numeric_limits<std::uint64_t>::max();
  EXPECT_EQ(msg::IndexOutOfRange(huge, 0u).id().render(),
            "The index 18446744073709551615 is out of range for size 0.");
}

// ---------------------------------------------------------------------------------------------
// Rendering, with a catalog of the test's own.

const except::Catalog& testCatalog() {
  static constexpr except::CatalogEntry entries[] = {
      {"Two", "{1} then {2}"},
      {"Swapped", "{2} before {1}, {1} again"},
      {"Literal", "{0} {x} { } {} {1 {-1} {18446744073709551617} {1}"},
      {"Edges", "{1}{2}"},
  };
  static constexpr except::Catalog catalog{"test:messages", entries};
  return catalog;
}

TEST(MessageIdRender, ReplacesNumberedPlaceholders) {
  struct Case {
    const char* key;
    std::vector<except::MessageArgument> arguments;
    const char* expected;
  };
  const Case cases[] = {
      {"Two", {std::string("a"), std::string("b")}, "a then b"},
      {"Two", {std::string("a")}, "a then {2}"},  // missing argument stays as written
      {"Two", {}, "{1} then {2}"},
      {"Two", {std::string("a"), std::string("b"), std::string("c")}, "a then b"},
      {"Swapped", {std::int64_t{1}, std::int64_t{-2}}, "-2 before 1, 1 again"},
      {"Literal", {std::string("A")}, "{0} {x} { } {} {1 {-1} {18446744073709551617} A"},
      {"Edges", {std::u16string(u"\u00e9"), std::u16string(u"\U0001F600")}, "\u00e9\U0001F600"},
      {"Edges", {std::string("{2}"), std::string("z")}, "{2}z"},  // arguments are not expanded again
      {"Unknown", {}, "test:messages/Unknown"},
      {"Unknown", {std::u16string(u"\u00fc"), std::int64_t{3}}, "test:messages/Unknown(\u00fc, 3)"},
  };
  for (const Case& c : cases) {
    const except::MessageId id(testCatalog(), c.key, c.arguments);
    EXPECT_EQ(id.render(), c.expected) << c.key;
    EXPECT_EQ(id.toString(), std::string("test:messages/") + c.key);
  }
}

TEST(MessageIdRender, IdFromACatalogNameAloneEqualsTheLinkedOneButHasNoText) {
  const except::MessageId linked(testCatalog(), "Two", {std::string("a"), std::int64_t{2}});
  const except::MessageId named("test:messages", "Two", {std::string("a"), std::int64_t{2}});
  EXPECT_EQ(named.catalog(), nullptr);
  EXPECT_EQ(linked, named);
  EXPECT_EQ(named.toString(), "test:messages/Two");
  EXPECT_EQ(named.render(), "test:messages/Two(a, 2)");
  EXPECT_NE(linked, except::MessageId("other:messages", "Two", {std::string("a"), std::int64_t{2}}));
  EXPECT_NE(linked, except::MessageId("test:messages", "Two", {std::string("a"), std::int64_t{3}}));
}

// ---------------------------------------------------------------------------------------------
// Exceptions.

TEST(Exception, WhatAndMessageShowTheRenderedText) {
  const except::Exception<msg::NoSuchProperty> e(msg::NoSuchProperty(u"Widget", u"colour"));
  EXPECT_STREQ(e.what(), "The type 'Widget' has no property 'colour'.");
  EXPECT_STREQ(e.message(), e.what());
  EXPECT_EQ(e.GetID(), "qf0:messages/NoSuchProperty");
  EXPECT_EQ(&e.GetBaseMsgIDObj(), &e.getMessage().id());
}

TEST(Exception, CatchesExactlyItsMessageTypeAndAllThroughTheCommonBases) {
  // Same argument types: only the message type tells them apart.
  auto raiseNoSuchClass = [] { qf::zero::reportException(msg::NoSuchClass(u"Shape")); };

  bool caughtAsOtherType = false;
  bool caughtAsOwnType = false;
  try {
    try {
      raiseNoSuchClass();
    } catch (const except::Exception<msg::NoSuchType>&) {
      caughtAsOtherType = true;
    }
  } catch (const except::Exception<msg::NoSuchClass>& e) {
    caughtAsOwnType = true;
    EXPECT_EQ(e.getMessage().id().arguments().at(0), except::MessageArgument(std::u16string(u"Shape")));
  }
  EXPECT_FALSE(caughtAsOtherType);
  EXPECT_TRUE(caughtAsOwnType);

  try {
    raiseNoSuchClass();
  } catch (const except::ExceptionBase& e) {
    EXPECT_EQ(e.GetID(), "qf0:messages/NoSuchClass");
    EXPECT_STREQ(e.message(), "The class 'Shape' is not registered.");
  }
  EXPECT_THROW(raiseNoSuchClass(), std::exception);
}

TEST(Exception, CloneOutlivesTheOriginalAndRethrowsTheExactTypeWithItsArguments) {
  std::unique_ptr<except::ExceptionBase> saved;
  try {
    qf::zero::reportException(msg::WrongArgumentCount(u"spin", 2, 3));
  } catch (const except::ExceptionBase& e) {
    saved = e.clone();
  }
  ASSERT_NE(saved, nullptr);
  EXPECT_STREQ(saved->message(), "The operation 'spin' takes 2 arguments but was given 3.");

  for (int round = 0; round < 2; ++round) {  // the copy can be rethrown more than once
    bool caught = false;
    try {
      saved->rethrow();
    } catch (const except::Exception<msg::WrongArgumentCount>& e) {
      caught = true;
      EXPECT_EQ(e.getMessage().id(), msg::WrongArgumentCount(u"spin", 2, 3).id());
      EXPECT_STREQ(e.what(), saved->message());
      EXPECT_NE(static_cast<const except::ExceptionBase*>(&e), saved.get());
    }
    EXPECT_TRUE(caught) << "round " << round;
  }
}

struct ModelFault {
  int code = 0;
};

TEST(Exception, ChosenStandardBaseAndExtraBaseAreCatchable) {
  using E = except::Exception<msg::ModelDestroyed, std::runtime_error, ModelFault>;
  const E original(msg::ModelDestroyed(), ModelFault{7});

  try {
    original.rethrow();
  } catch (const ModelFault& fault) {
    EXPECT_EQ(fault.code, 7);
  }
  try {
    original.clone()->rethrow();
  } catch (const std::runtime_error& e) {
    EXPECT_STREQ(e.what(), "The model has been destroyed.");
    EXPECT_EQ(dynamic_cast<const E&>(e).extra().code, 7);
  }
}

}  // namespace
