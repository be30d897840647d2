#include "kiv/metamodel/delta_impl.h"

#include "qf/zero/core/messages.h"
#include "qf/zero/core/report_exception.h"

namespace kiv {

bool Delta::Impl::isEmpty() const {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Delta.isEmpty"));
}

::kiv::ObjectStorage Delta::Impl::getCurrent(const qf::zero::Uuid& /*uuid*/) const {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Delta.getCurrent"));
}

::kiv::ObjectStorage Delta::Impl::getPrevious(const qf::zero::Uuid& /*uuid*/) const {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Delta.getPrevious"));
}

void Delta::Impl::addCreated(const ::kiv::ObjectStorage& /*current*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Delta.addCreated"));
}

void Delta::Impl::addUpdated(const ::kiv::ObjectStorage& /*previous*/, const ::kiv::ObjectStorage& /*current*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Delta.addUpdated"));
}

void Delta::Impl::addDeleted(const ::kiv::ObjectStorage& /*previous*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Delta.addDeleted"));
}

bool Delta::Impl::isCreated(const qf::zero::Uuid& /*uuid*/) const {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Delta.isCreated"));
}

bool Delta::Impl::isUpdated(const qf::zero::Uuid& /*uuid*/) const {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Delta.isUpdated"));
}

bool Delta::Impl::isDeleted(const qf::zero::Uuid& /*uuid*/) const {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Delta.isDeleted"));
}

::kiv::Delta Delta::Impl::compose(const std::vector<::kiv::Delta>& /*deltas*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Delta.compose"));
}

::kiv::Delta Delta::Impl::invert() const {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Delta.invert"));
}

void Delta::Impl::setPrevious(const ::kiv::Delta& /*delta*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Delta.setPrevious"));
}

void Delta::Impl::addUpdated(const ::kiv::ObjectStorage& /*current*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Delta.addUpdated"));
}

bool Delta::Impl::isEqual(const ::kiv::Delta& /*delta*/) const {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Delta.isEqual"));
}

qf::zero::JsonValue Delta::Impl::toChangeReport() const {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Delta.toChangeReport"));
}

}  // namespace kiv
