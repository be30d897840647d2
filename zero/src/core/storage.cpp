#include "qf/zero/core/internal/storage.h"

#include "qf/zero/core/owned_collection.h"

#include <algorithm>
#include <iterator>

namespace qf::zero {

void undoInSequence(std::vector<Value>& items, const std::vector<ModelElement::Impl::CollectionEdit>& edits) {
  using Kind = ModelElement::Impl::CollectionEdit::Kind;
  for (auto edit = edits.rbegin(); edit != edits.rend(); ++edit) {
    const auto at = static_cast<std::ptrdiff_t>(std::min(edit->position, items.size()));
    if (edit->kind == Kind::Erased) {
      items.insert(items.begin() + at, edit->item);
    } else if (edit->position < items.size()) {
      items.erase(items.begin() + at);
    }
  }
}

ModelElement::Impl::Storage::Storage(const Uuid& id, const Model&, const meta::Class& metaClass, int count)
    : uuid_(id), metaClass_(metaClass), changed_(static_cast<std::size_t>(count + 63) / 64 + 1, 0) {}

bool ModelElement::Impl::Storage::isChanged(int index) const noexcept {
  const auto word = static_cast<std::size_t>(index) / 64;
  return word < changed_.size() && (changed_[word] >> (index % 64) & 1U) != 0;
}

void ModelElement::Impl::Storage::setChanged(int index, bool changed) {
  const auto word = static_cast<std::size_t>(index) / 64;
  if (word >= changed_.size()) changed_.resize(word + 1, 0);
  const std::uint64_t bit = std::uint64_t{1} << (index % 64);
  changed_[word] = changed ? (changed_[word] | bit) : (changed_[word] & ~bit);
}

bool ModelElement::Impl::Storage::anyChanged() const noexcept {
  for (std::uint64_t word : changed_) {
    if (word != 0) return true;
  }
  return false;
}

std::vector<int> ModelElement::Impl::Storage::changedIndexes() const {
  std::vector<int> result;
  for (std::size_t word = 0; word < changed_.size(); ++word) {
    for (std::uint64_t bits = changed_[word]; bits != 0; bits &= bits - 1) {
      const int index = static_cast<int>(word * 64) + __builtin_ctzll(bits);
      if (index != kContainerIndex) result.push_back(index);
    }
  }
  return result;
}

ModelElement::Impl::Storage::Slot& ModelElement::Impl::Storage::slot(int index) {
  if (static_cast<std::size_t>(index) >= slots_.size()) slots_.resize(static_cast<std::size_t>(index) + 1);
  return slots_[static_cast<std::size_t>(index)];
}

void ModelElement::Impl::Storage::setOldValue(int index, Value value) {
  Slot& s = slot(index);
  s.value = std::move(value);
  s.kind = SlotKind::Value;
}

void ModelElement::Impl::Storage::setOldCollection(int index, std::vector<Value> items) {
  Slot& s = slot(index);
  s.items = std::move(items);
  s.edits.clear();
  s.kind = SlotKind::Contents;
}

void ModelElement::Impl::Storage::startEditLog(int index) {
  Slot& s = slot(index);
  s.items.clear();
  s.edits.clear();
  s.kind = SlotKind::EditLog;
}

bool ModelElement::Impl::Storage::holdsSlot(int index) const {
  return static_cast<std::size_t>(index) < slots_.size() &&
         slots_[static_cast<std::size_t>(index)].kind != SlotKind::Empty;
}

bool ModelElement::Impl::Storage::holdsCollection(int index) const {
  if (static_cast<std::size_t>(index) >= slots_.size()) return false;
  const SlotKind kind = slots_[static_cast<std::size_t>(index)].kind;
  return kind == SlotKind::Contents || kind == SlotKind::EditLog;
}

bool ModelElement::Impl::Storage::holdsEditLog(int index) const {
  return static_cast<std::size_t>(index) < slots_.size() &&
         slots_[static_cast<std::size_t>(index)].kind == SlotKind::EditLog;
}

const Value& ModelElement::Impl::Storage::oldValue(int index) const {
  return slots_.at(static_cast<std::size_t>(index)).value;
}

const std::vector<Value>& ModelElement::Impl::Storage::oldCollection(int index) const {
  return slots_.at(static_cast<std::size_t>(index)).items;
}

std::vector<ModelElement::Impl::CollectionEdit>* ModelElement::Impl::Storage::editLog(int index) {
  return holdsEditLog(index) ? &slots_[static_cast<std::size_t>(index)].edits : nullptr;
}

const std::vector<ModelElement::Impl::CollectionEdit>& ModelElement::Impl::Storage::editLogOf(
    int index) const {
  return slots_.at(static_cast<std::size_t>(index)).edits;
}

void ModelElement::Impl::Storage::materialize(Impl* element) {
  for (std::size_t index = 0; index < slots_.size(); ++index) {
    Slot& s = slots_[index];
    if (s.kind != SlotKind::EditLog) continue;
    const meta::Property property = element->propertyForSlot(static_cast<int>(index));
    s.items = element->basicGetCollection(property)->contentsBefore(s.edits);
    s.edits = {};
    s.kind = SlotKind::Contents;
  }
}

Value ModelElement::Impl::Storage::getOldValue(const meta::Property& property, AccessTag) const {
  const int index = property.getIndex();
  if (holdsCollection(index)) return Value::list(oldCollection(index), property);
  return oldValue(index);
}

void ModelElement::Impl::Storage::revertUnchanged(Impl* element) {
  materialize(element);
  if (isChanged(kContainerIndex) && oldContainer_.getImpl() == element->containerImpl() &&
      oldFeature_ == element->containmentFeature()) {
    setChanged(kContainerIndex, false);
  }
  for (int index : changedIndexes()) {
    if (!holdsSlot(index)) continue;
    const meta::Property property = element->propertyForSlot(index);
    const bool same = holdsCollection(index)
                          ? element->basicGetCollection(property)->sameContents(oldCollection(index))
                          : element->basicGetValue(property) == oldValue(index);
    if (same) setChanged(index, false);
  }
}

void ModelElement::Impl::Storage::setOldContainer(const ModelElement& container,
                                                  const meta::Property& feature) {
  oldContainer_ = container;
  oldFeature_ = feature;
}

void ModelElement::Impl::Storage::mergeInto(Storage& outer) {
  if (isChanged(kContainerIndex) && !outer.isChanged(kContainerIndex)) {
    outer.setOldContainer(oldContainer_, oldFeature_);
    outer.setChanged(kContainerIndex, true);
  }
  for (int index : changedIndexes()) {
    if (!holdsSlot(index)) continue;
    if (!outer.isChanged(index)) {
      outer.slot(index) = std::move(slot(index));
      outer.setChanged(index, true);
    } else if (std::vector<CollectionEdit>* outerLog = outer.editLog(index);
               outerLog && holdsEditLog(index)) {
      std::vector<CollectionEdit>& log = slot(index).edits;
      if (outerLog->empty()) {
        *outerLog = std::move(log);
      } else {
        outerLog->insert(outerLog->end(), std::make_move_iterator(log.begin()),
                         std::make_move_iterator(log.end()));
      }
    }
  }
}

}  // namespace qf::zero
