// What the history classes share: transactions on an element's model, argument checks,
// and the presence rule of delta maps.
#pragma once

#include "kiv/metamodel/object_storage_impl.h"
#include "qf/zero/core/element_impl.h"
#include "qf/zero/core/messages.h"
#include "qf/zero/core/model_impl.h"
#include "qf/zero/core/reference_collection.h"
#include "qf/zero/core/report_exception.h"
#include "qf/zero/core/transaction.h"

#include <map>
#include <string_view>

namespace kiv::history {

using StorageMap = qf::zero::TypedReferenceCollectionWithProxies<ObjectStorage, std::map<qf::zero::Uuid, ObjectStorage>>;

// A transaction (a savepoint of the caller's, when one is open) on the model of
// `element`, which must be live: proxies and destroyed elements raise.
inline qf::zero::Transaction beginTransactionOn(const qf::zero::ModelElement::Impl& element) {
  if (element.isProxy()) qf::zero::reportException(qf0::messages::CannotModifyProxy());
  if (!element.isLive()) qf::zero::reportException(qf0::messages::CannotModifyDestroyedElement());
  return element.getModelImpl()->beginTransaction();
}

// Raises "ElementRequired" naming `operation` unless `element` is a live element.
inline void requireLive(const qf::zero::ModelElement& element, std::u16string_view operation) {
  if (!element || !element.isLive()) {
    qf::zero::reportException(qf0::messages::ElementRequired(std::u16string(operation)));
  }
}

inline bool isLive(const qf::zero::ModelElement& element) { return element && element.isLive(); }

// The identity of an element, also when it is a proxy that stands for it.
inline qf::zero::Uuid identityOf(const qf::zero::ModelElement& element) {
  return element.isProxy() ? element->getProxyId().elementId : element.getUuid();
}

// The entry the map holds for `uuid` when it is present: held, resolved and live. A
// dangling, unresolved or destroyed entry counts as absent.
inline ObjectStorage presentEntry(const StorageMap& map, const qf::zero::Uuid& uuid) {
  const auto& items = map.container();
  const auto it = items.find(uuid);
  if (it == items.end()) return {};
  if (it->second.isLive()) return it->second;
  const qf::zero::ModelElement resolved = map.resolveProxy(it->second);
  return isLive(resolved) ? qf::zero::elementCast<ObjectStorage>(resolved) : ObjectStorage();
}

// Calls visit(uuid, storage) for every present entry, in ascending UUID order.
template <class Visit>
void forEachPresent(const StorageMap& map, Visit&& visit) {
  for (const auto& [uuid, held] : map.container()) {
    if (held.isLive()) {
      visit(uuid, held);
    } else if (const ObjectStorage resolved = presentEntry(map, uuid)) {
      visit(uuid, resolved);
    }
  }
}

}  // namespace kiv::history
