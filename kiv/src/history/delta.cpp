#include "history/history_support.h"
#include "kiv/messages/messages.h"
#include "kiv/metamodel/delta_impl.h"
#include "kiv/metamodel/object_storage_impl.h"

namespace kiv {

using history::forEachPresent;
using history::presentEntry;

bool Delta::Impl::isEmpty() const { return previous_.size() == 0 && current_.size() == 0; }

ObjectStorage Delta::Impl::getCurrent(const qf::zero::Uuid& uuid) const {
  return presentEntry(current_, uuid);
}

ObjectStorage Delta::Impl::getPrevious(const qf::zero::Uuid& uuid) const {
  return presentEntry(previous_, uuid);
}

bool Delta::Impl::isCreated(const qf::zero::Uuid& uuid) const {
  return !presentEntry(previous_, uuid) && presentEntry(current_, uuid);
}

bool Delta::Impl::isUpdated(const qf::zero::Uuid& uuid) const {
  return presentEntry(previous_, uuid) && presentEntry(current_, uuid);
}

bool Delta::Impl::isDeleted(const qf::zero::Uuid& uuid) const {
  return presentEntry(previous_, uuid) && !presentEntry(current_, uuid);
}

void Delta::Impl::addCreated(const ObjectStorage& current) {
  qf::zero::Transaction transaction = history::beginTransactionOn(*this);
  getCurrentMutable().add(current);
  transaction.commit();
}

void Delta::Impl::addDeleted(const ObjectStorage& previous) {
  qf::zero::Transaction transaction = history::beginTransactionOn(*this);
  getPreviousMutable().add(previous);
  transaction.commit();
}

void Delta::Impl::addUpdated(const ObjectStorage& previous, const ObjectStorage& current) {
  qf::zero::Transaction transaction = history::beginTransactionOn(*this);
  getPreviousMutable().add(previous);
  getCurrentMutable().add(current);
  transaction.commit();
}

void Delta::Impl::addUpdated(const ObjectStorage& current) {
  history::requireLive(current, u"kiv.Delta.addUpdated");
  const qf::zero::Uuid element = current.getElementUUID().value_or(qf::zero::Uuid());
  if (!presentEntry(previous_, element)) {
    qf::zero::reportException(messages::NoSuchElement(qf::zero::toText(element)));
  }
  addCreated(current);
}

void Delta::Impl::setPrevious(const Delta& other) {
  history::requireLive(other, u"kiv.Delta.setPrevious");
  qf::zero::Transaction transaction = history::beginTransactionOn(*this);
  PreviousCollection& previous = getPreviousMutable();
  previous.clear();
  forEachPresent(other->current_,
                 [&](const qf::zero::Uuid&, const ObjectStorage& storage) { previous.add(storage); });
  transaction.commit();
}

// The inverse shares this delta's storages: a created element becomes deleted, a deleted
// one created, and an update runs backwards.
Delta Delta::Impl::invert() const {
  qf::zero::Transaction transaction = history::beginTransactionOn(*this);
  const Delta inverse = Delta::create(getModel());
  Impl& target = *inverse.getImpl();
  target.setIsSnapshot(isSnapshot_);
  PreviousCollection& previous = target.getPreviousMutable();
  CurrentCollection& current = target.getCurrentMutable();
  forEachPresent(current_,
                 [&](const qf::zero::Uuid&, const ObjectStorage& storage) { previous.add(storage); });
  forEachPresent(previous_,
                 [&](const qf::zero::Uuid&, const ObjectStorage& storage) { current.add(storage); });
  transaction.commit();
  return inverse;
}

// Equal means the same recorded delta: identical own UUIDs as well as equal storages, as
// needed when histories of two repositories are compared.
bool Delta::Impl::isEqual(const Delta& other) const {
  if (!history::isLive(other)) return false;
  const Impl& that = *other.getImpl();
  if (that.current_.size() != current_.size() || that.previous_.size() != previous_.size()) return false;
  const auto sameEntries = [](const history::StorageMap& mine, const history::StorageMap& theirs) {
    for (const auto& entry : mine.container()) {
      const ObjectStorage held = presentEntry(mine, entry.first);
      const ObjectStorage counterpart = presentEntry(theirs, entry.first);
      if (!held || !counterpart || !held->isEqual(counterpart)) return false;
    }
    return true;
  };
  return sameEntries(current_, that.current_) && sameEntries(previous_, that.previous_) &&
         that.isSnapshot_ == isSnapshot_ && other.getUuid() == getUuid();
}

}  // namespace kiv
