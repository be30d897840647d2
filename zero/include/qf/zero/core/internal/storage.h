// ModelElement::Impl::Storage: the old-value record of one element in one
// transaction (or savepoint).
//
// The first time a property changes, its old value is copied into the storage and
// its changed bit set (bit `index`, index 0 being the container). The record answers
// getOldValue for change reports, restores the element on rollback, and at commit
// revertUnchanged drops the bits of properties whose value came back to the old one:
// a property changed and changed back is not a change.
//
// Generated element classes derive their own storage with typed slots for their
// single-valued properties; they answer those indexes first and pass the rest on.
// The generic slots below hold the others: `holdsSlot(index)` is false for an index
// whose old value a derived storage keeps.
#pragma once

#include "qf/zero/core/internal/element_impl.h"
#include "qf/zero/core/meta/structured_type.h"
#include "qf/zero/core/value.h"

#include <cstdint>
#include <optional>
#include <vector>

namespace qf::zero {

class ModelElement::Impl::Storage {
 public:
  Storage(const Uuid& id, const Model& model, const meta::Class& metaClass, int count);
  virtual ~Storage() = default;
  Storage(const Storage&) = delete;
  Storage& operator=(const Storage&) = delete;

  const Uuid& getUuid() const noexcept { return uuid_; }
  const meta::Class& getMetaClass() const noexcept { return metaClass_; }

  bool isChanged(int index) const noexcept;
  void setChanged(int index, bool changed);
  bool anyChanged() const noexcept;
  // Changed property indexes (container excluded), ascending.
  std::vector<int> changedIndexes() const;

  // Slots, written by Impl::copyValue.
  void setOldValue(int index, Value value);
  void setOldCollection(int index, std::vector<Value> items);
  bool holdsSlot(int index) const;
  bool holdsCollection(int index) const;
  const Value& oldValue(int index) const;
  const std::vector<Value>& oldCollection(int index) const;

  // The old value of `property`: a list value for a many-valued one.
  // REQUIRES: isChanged(property index).
  virtual Value getOldValue(const meta::Property& property, AccessTag tag = AccessTag::Default) const;
  // Clears the bit of every property whose current value in `element` equals the old one.
  virtual void revertUnchanged(Impl* element);

  void setOldContainer(const ModelElement& container, const meta::Property& feature);
  const ModelElement& getOldContainer() const noexcept { return oldContainer_; }
  const meta::Property& getOldContainmentFeature() const noexcept { return oldFeature_; }

  // Savepoint commit: moves into `outer` (the same element's record one level out)
  // every slot that `outer` does not hold yet.
  virtual void mergeInto(Storage& outer);

 private:
  struct Slot {
    Value value;
    std::vector<Value> items;
    bool isCollection = false;
    bool present = false;
  };
  Slot& slot(int index);

  Uuid uuid_;
  meta::Class metaClass_;
  std::vector<std::uint64_t> changed_;
  std::vector<Slot> slots_;
  ModelElement oldContainer_;
  meta::Property oldFeature_;
};

}  // namespace qf::zero
