#include "foundation/core/except/message_id.h"
#include "kiv/messages/messages.h"
#include "support/message_catalog_checks.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

namespace {

namespace except = foundation::core::except;
using support::messageRow;
namespace msg = kiv::messages;

TEST(KivMessages, EveryKeyHasATextAndAClassWhoseArgumentsFillItsPlaceholders) {
  const std::vector<support::MessageRow> rows = {
      messageRow<msg::BranchExists>(u"f\u00e9ature"),
      messageRow<msg::CannotAddParent>("5f0e9d8c-7b6a-4594-8372-615049382716"),
      messageRow<msg::CannotCheckout>(u"release/\U0001F680"),
      messageRow<msg::CannotCommit>(),
      messageRow<msg::CannotComposeZeroDeltas>(),
      messageRow<msg::CannotFindElement>(u"7c9e6679-7425-40de-944b-e07fc1f90ae7"),
      messageRow<msg::CannotPull>(),
      messageRow<msg::CannotPush>(),
      messageRow<msg::CannotRedo>(),
      messageRow<msg::CannotUndo>(),
      messageRow<msg::HeadDelete>(),
      messageRow<msg::MalformedHistory>("cyclic parents"),
      messageRow<msg::ModelsIdentical>(),
      messageRow<msg::ModelsSwapped>(),
      messageRow<msg::NoOrigin>(),
      messageRow<msg::NoSuchElement>("0b2c5a9e-3f1d-4c2b-9a8e-7d6c5b4a3f21"),
      messageRow<msg::NoSuchElementCur>("9f8e7d6c-5b4a-4321-8fed-cba987654321"),
      messageRow<msg::NoUniqueLCA>(),
      messageRow<msg::PushBare>(),
      messageRow<msg::UnexpectedPacket>("expecting OK"),
  };
  EXPECT_EQ(msg::catalog().name(), "kiv:messages");
  support::checkCatalog(msg::catalog(), rows);
}

TEST(KivMessages, MessagesOfBothCatalogsAreToldApartByCatalogName) {
  const except::MessageId kivId = msg::NoSuchElement("x").id();
  const except::MessageId sameKeyElsewhere("qf0:messages", "NoSuchElement", {std::string("x")});
  EXPECT_NE(kivId, sameKeyElsewhere);
  EXPECT_EQ(kivId, except::MessageId("kiv:messages", "NoSuchElement", {std::string("x")}));
}

}  // namespace
