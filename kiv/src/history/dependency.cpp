#include "kiv/metamodel/dependency_impl.h"

#include "qf/zero/core/messages.h"
#include "qf/zero/core/report_exception.h"

namespace kiv {

void Dependency::Impl::load() {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Dependency.load"));
}

}  // namespace kiv
