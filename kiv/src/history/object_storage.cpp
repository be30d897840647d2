#include "kiv/metamodel/object_storage_impl.h"

#include "qf/zero/core/messages.h"
#include "qf/zero/core/report_exception.h"

namespace kiv {

::kiv::ObjectStorage ObjectStorage::Impl::setContent(const qf::zero::ModelElement& /*element*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.ObjectStorage.setContent"));
}

bool ObjectStorage::Impl::isEmpty() const {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.ObjectStorage.isEmpty"));
}

qf::zero::ModelElement ObjectStorage::Impl::instantiate(const qf::zero::Model& /*model*/) const {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.ObjectStorage.instantiate"));
}

bool ObjectStorage::Impl::isEqual(const ::kiv::ObjectStorage& /*os*/) const {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.ObjectStorage.isEqual"));
}

}  // namespace kiv
