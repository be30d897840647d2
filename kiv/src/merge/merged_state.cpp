#include "merge/merged_state.h"

#include "kiv/metamodel/object_storage_impl.h"

#include <nlohmann/json.hpp>

#include <algorithm>

namespace kiv::merge {

using history::presentEntry;
using qf::zero::JsonValue;
using qf::zero::Uuid;

MergedState::MergedState(Delta::Impl& merged, const history::StateEntries& base)
    : merged_(merged), base_(base) {}

const JsonValue* MergedState::find(const Uuid& uuid) {
  if (const auto it = entries_.find(uuid); it != entries_.end())
    return it->second.is_null() ? nullptr : &it->second;
  const ObjectStorage storage = presentEntry(merged_.getCurrent(), uuid);
  JsonValue& entry = entries_[uuid];
  if (storage) entry = storage.getContent();
  return entry.is_null() ? nullptr : &entry;
}

const JsonValue* MergedState::findInBase(const Uuid& uuid) {
  if (const auto it = baseEntries_.find(uuid); it != baseEntries_.end())
    return it->second.is_null() ? nullptr : &it->second;
  const ObjectStorage storage = baseEntry(uuid);
  JsonValue& entry = baseEntries_[uuid];
  if (storage) entry = storage.getContent();
  return entry.is_null() ? nullptr : &entry;
}

bool MergedState::isDeleted(const Uuid& uuid) {
  return find(uuid) == nullptr && presentEntry(merged_.getPrevious(), uuid);
}

JsonValue MergedState::deletedEntry(const Uuid& uuid) const {
  const ObjectStorage storage = presentEntry(merged_.getPrevious(), uuid);
  return storage ? storage.getContent() : JsonValue();
}

ObjectStorage MergedState::baseEntry(const Uuid& uuid) const {
  return history::ComposedState::entryOf(base_, uuid);
}

void MergedState::put(const Uuid& uuid, JsonValue entry, std::vector<ObjectStorage> sameAs) {
  entries_[uuid] = std::move(entry);
  Rewrite& rewrite = rewritten_[uuid];
  rewrite.sameAs.insert(rewrite.sameAs.end(), sameAs.begin(), sameAs.end());
}

// What the comparison changed is read once: it stays as it is while the merge rewrites.
std::vector<Uuid> MergedState::changed() const {
  if (!comparedChanges_) {
    comparedChanges_.emplace();
    history::forEachPresent(merged_.getCurrent(), [&](const Uuid& uuid, const ObjectStorage& storage) {
      if (baseEntry(uuid) != storage) comparedChanges_->push_back(uuid);
    });
  }
  std::vector<Uuid> changed = *comparedChanges_;
  for (const auto& rewrite : rewritten_) changed.push_back(rewrite.first);
  std::sort(changed.begin(), changed.end());
  changed.erase(std::unique(changed.begin(), changed.end()), changed.end());
  return changed;
}

void MergedState::write() {
  std::vector<Uuid> order;
  for (const auto& rewrite : rewritten_) order.push_back(rewrite.first);
  std::sort(order.begin(), order.end());
  history::StorageMap& current = merged_.getCurrentMutable();
  history::StorageMap& previous = merged_.getPreviousMutable();
  for (const Uuid& uuid : order) {
    const JsonValue& entry = entries_.at(uuid);
    ObjectStorage storage;
    for (const ObjectStorage& candidate : rewritten_.at(uuid).sameAs) {
      if (history::isLive(candidate) && candidate.getContent() == entry) {
        storage = candidate;
        break;
      }
    }
    if (!storage) {
      storage =
          ObjectStorage::Builder(merged_.getModel()).doSetElementUUID(uuid).doSetContent(entry).create();
    }
    if (const auto it = current.container().find(uuid); it != current.container().end()) {
      if (it->second == storage) continue;
      current.remove(ObjectStorage(it->second));
    } else if (!presentEntry(previous, uuid)) {
      if (const ObjectStorage before = baseEntry(uuid)) previous.add(before);
    }
    current.add(storage);
  }
}

}  // namespace kiv::merge
