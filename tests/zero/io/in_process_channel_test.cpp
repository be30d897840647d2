#include "qf/zero/io/in_process_channel.h"

#include "support/channel_test_cases.h"

#include <gtest/gtest.h>

namespace support {

namespace {

ChannelKind inProcessChannels() {
  return {"InProcess", [] {
            auto [a, b] = qf::zero::io::InProcessChannel::createPair();
            return ChannelPair{a, b};
          }};
}

}  // namespace

INSTANTIATE_TEST_SUITE_P(InProcess, ChannelContract, testing::Values(inProcessChannels()), kindName);
INSTANTIATE_TEST_SUITE_P(InProcess, PacketExchange, testing::Values(inProcessChannels()), kindName);

}  // namespace support
