// What the history classes share: transactions on an element's model, argument checks,
// and the presence rule of delta maps.
#pragma once

#include "kiv/metamodel/object_storage_impl.h"
#include "qf/zero/core/internal/element_impl.h"
#include "qf/zero/core/messages.h"
#include "qf/zero/core/model_impl.h"
#include "qf/zero/core/reference_collection.h"
#include "qf/zero/core/report_exception.h"
#include "qf/zero/core/transaction.h"

#include <map>
#include <string_view>

namespace kiv::history {

using StorageMap =
    qf::zero::TypedReferenceCollectionWithProxies<ObjectStorage, std::map<qf::zero::Uuid, ObjectStorage>>;

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

// The storage an entry stands for when it is present: live, or a proxy whose storage
// is resident and live. Peeking loads nothing and raises nothing.
inline ObjectStorage residentOf(const StorageMap& map, const ObjectStorage& held) {
  if (held.isLive()) return held;
  if (!held.isProxy()) return {};
  const qf::zero::ModelElement resident = map.peekResolveProxy(held);
  return isLive(resident) ? qf::zero::elementCast<ObjectStorage>(resident) : ObjectStorage();
}

// The entry the map holds for `uuid` when it is present. A dangling, unresolved or
// destroyed entry counts as absent. A proxy's key is unknown until its storage arrives,
// so the map files it under the nil UUID; it is found there once it resolves.
inline ObjectStorage presentEntry(const StorageMap& map, const qf::zero::Uuid& uuid) {
  const auto& items = map.container();
  if (const auto it = items.find(uuid); it != items.end()) {
    if (ObjectStorage storage = residentOf(map, it->second)) return storage;
  }
  if (uuid.is_nil()) return {};
  if (const auto it = items.find(qf::zero::Uuid()); it != items.end() && it->second.isProxy()) {
    ObjectStorage storage = residentOf(map, it->second);
    if (storage && storage.getElementUUID() == uuid) return storage;
  }
  return {};
}

// Calls visit(uuid, storage) for every present entry, in map order, with the UUID of the
// element the storage holds.
template <class Visit>
void forEachPresent(const StorageMap& map, Visit&& visit) {
  for (const auto& [key, held] : map.container()) {
    if (held.isLive()) {
      visit(key, held);
    } else if (const ObjectStorage resident = residentOf(map, held)) {
      visit(resident.getElementUUID().value_or(key), resident);
    }
  }
}

}  // namespace kiv::history
