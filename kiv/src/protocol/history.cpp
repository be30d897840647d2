#include "kiv/metamodel/protocol/history_impl.h"
#include "qf/zero/core/messages.h"
#include "qf/zero/core/report_exception.h"

#include <nlohmann/json.hpp>

namespace kiv::protocol {

::kiv::protocol::History History::Impl::parseHistory(const qf::zero::JsonValue& /*historyJson*/,
                                                     const qf::zero::Model& /*model*/,
                                                     const std::vector<std::u16string>& /*properties*/,
                                                     const qf::zero::Model& /*otherModel*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.protocol.History.parseHistory"));
}

qf::zero::JsonValue History::Impl::pack() {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.protocol.History.pack"));
}

void History::Impl::resolveCommits() {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.protocol.History.resolveCommits"));
}

::kiv::protocol::History History::Impl::unpack(const qf::zero::JsonValue& /*historyJson*/,
                                               const qf::zero::Model& /*model*/,
                                               const qf::zero::Model& /*otherModel*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.protocol.History.unpack"));
}

::kiv::protocol::History History::Impl::unpackBranches(const qf::zero::JsonValue& /*historyJson*/,
                                                       const qf::zero::Model& /*model*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.protocol.History.unpackBranches"));
}

::kiv::protocol::History History::Impl::unpackNonBranches(const qf::zero::JsonValue& /*historyJson*/,
                                                          const qf::zero::Model& /*model*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.protocol.History.unpackNonBranches"));
}

bool History::Impl::isEquivalent(const ::kiv::protocol::History& /*history*/) const {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.protocol.History.isEquivalent"));
}

void History::Impl::clear() {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.protocol.History.clear"));
}

}  // namespace kiv::protocol
