#include "kiv/metamodel/repository_impl.h"
#include "qf/zero/core/messages.h"
#include "qf/zero/core/report_exception.h"

#include <nlohmann/json.hpp>

namespace kiv {

bool Repository::Impl::isEmpty() const {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Repository.isEmpty"));
}

void Repository::Impl::add(const ::kiv::Branch& /*branch*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Repository.add"));
}

void Repository::Impl::remove(const std::u16string& /*branch*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Repository.remove"));
}

void Repository::Impl::sync(const ::kiv::Repository& /*src*/,
                            const std::function<void(const kiv::Branch&, const kiv::Branch&)>& /*f*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Repository.sync"));
}

void Repository::Impl::setSynchronizationChannel(
    const std::shared_ptr<qf::zero::io::SynchronizationChannel>& /*channel*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Repository.setSynchronizationChannel"));
}

bool Repository::Impl::canCheckout(const std::u16string& /*branch*/) const {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Repository.canCheckout"));
}

void Repository::Impl::syncCreated(const ::kiv::Repository& /*src*/,
                                   const std::function<void(const kiv::Branch&)>& /*f*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Repository.syncCreated"));
}

void Repository::Impl::syncUpdated(const ::kiv::Repository& /*src*/,
                                   const std::function<void(const kiv::Branch&, const kiv::Branch&)>& /*f*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Repository.syncUpdated"));
}

void Repository::Impl::syncDeleted(const ::kiv::Repository& /*src*/,
                                   const std::function<void(const kiv::Branch&)>& /*f*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Repository.syncDeleted"));
}

::kiv::Repository Repository::Impl::unpackHistory(const qf::zero::JsonValue& /*historyJson*/) const {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Repository.unpackHistory"));
}

bool Repository::Impl::canPush(const ::kiv::protocol::History& /*history*/) const {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Repository.canPush"));
}

void Repository::Impl::syncBranches(const ::kiv::Repository& /*src*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Repository.syncBranches"));
}

bool Repository::Impl::isEquivalent(const ::kiv::Repository& /*repo*/) const {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Repository.isEquivalent"));
}

void Repository::Impl::addRepositoryObserver(const ::kiv::RepositoryObserver& /*observer*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Repository.addRepositoryObserver"));
}

void Repository::Impl::removeRepositoryObserver(const ::kiv::RepositoryObserver& /*observer*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Repository.removeRepositoryObserver"));
}

void Repository::Impl::addRepositoryListener() {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Repository.addRepositoryListener"));
}

void Repository::Impl::removeRepositoryListener() {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Repository.removeRepositoryListener"));
}

void Repository::Impl::notifyObservers() {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Repository.notifyObservers"));
}

std::string Repository::Impl::toString(::kiv::protocol::PacketType /*packetType*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Repository.toString"));
}

std::string Repository::Impl::serializeAggregate(const qf::zero::ModelElement& /*element*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Repository.serializeAggregate"));
}

}  // namespace kiv
