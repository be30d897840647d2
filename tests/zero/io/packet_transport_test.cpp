#include "qf/zero/io/packet_transport.h"

#include "foundation/core/except/exception.h"
#include "qf/zero/core/messages.h"

#include <gtest/gtest.h>

#include <memory>

namespace {

// Exchanges over real channels are covered, per channel kind, by support/channel_test_cases.h.

TEST(PacketTransport, ANullChannelIsRefusedWithACatalogError) {
  try {
    qf::zero::io::PacketTransport transport{std::shared_ptr<qf::zero::io::SynchronizationChannel>()};
    FAIL() << "a transport was made without a channel";
  } catch (const foundation::core::except::ExceptionBase& error) {
    EXPECT_EQ(error.GetID(), "qf0:messages/CannotCreateTransportWithoutChannel");
  }
}

}  // namespace
