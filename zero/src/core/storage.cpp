#include "qf/zero/core/internal/storage.h"

#include "qf/zero/core/owned_collection.h"

namespace qf::zero {

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
  s.isCollection = false;
  s.present = true;
}

void ModelElement::Impl::Storage::setOldCollection(int index, std::vector<Value> items) {
  Slot& s = slot(index);
  s.items = std::move(items);
  s.isCollection = true;
  s.present = true;
}

bool ModelElement::Impl::Storage::holdsSlot(int index) const {
  return static_cast<std::size_t>(index) < slots_.size() && slots_[static_cast<std::size_t>(index)].present;
}

bool ModelElement::Impl::Storage::holdsCollection(int index) const {
  return static_cast<std::size_t>(index) < slots_.size() &&
         slots_[static_cast<std::size_t>(index)].isCollection;
}

const Value& ModelElement::Impl::Storage::oldValue(int index) const {
  return slots_.at(static_cast<std::size_t>(index)).value;
}

const std::vector<Value>& ModelElement::Impl::Storage::oldCollection(int index) const {
  return slots_.at(static_cast<std::size_t>(index)).items;
}

Value ModelElement::Impl::Storage::getOldValue(const meta::Property& property, AccessTag) const {
  const int index = property.getIndex();
  if (holdsCollection(index)) return Value::list(oldCollection(index), property);
  return oldValue(index);
}

void ModelElement::Impl::Storage::revertUnchanged(Impl* element) {
  if (isChanged(kContainerIndex) && oldContainer_.getImpl() == element->containerImpl() &&
      oldFeature_ == element->containmentFeature()) {
    setChanged(kContainerIndex, false);
  }
  for (int index : changedIndexes()) {
    if (!holdsSlot(index)) continue;
    const meta::Property property = element->getPropertyByIndex(index);
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
    if (outer.isChanged(index) || !holdsSlot(index)) continue;
    outer.slot(index) = std::move(slot(index));
    outer.setChanged(index, true);
  }
}

}  // namespace qf::zero
