// ModelElement::Impl::Storage: the old-value record of one element in one
// transaction (or savepoint).
//
// The first time a property changes, its old value is copied into the storage and
// its changed bit set (bit `index`, index 0 being the container). The record answers
// getOldValue for change reports, restores the element on rollback, and at commit
// revertUnchanged drops the bits of properties whose value came back to the old one:
// a property changed and changed back is not a change.
//
// A collection is not copied: its slot logs the raw edits made to it at this level, so
// that a change costs the same in a collection of ten items or of a million, and in the
// hundredth nested savepoint as in the first. Rollback undoes the log; a change report
// rebuilds the old contents once, from the current ones and the log (materialize).
//
// Generated element classes derive their own storage with typed slots for their
// single-valued properties; they answer those indexes first and pass the rest on.
// The generic slots below hold the others: `holdsSlot(index)` is false for an index
// whose old value a derived storage keeps.
#pragma once

#include "qf/zero/core/internal/element_impl.h"
#include "qf/zero/core/map_key.h"
#include "qf/zero/core/meta/structured_type.h"
#include "qf/zero/core/value.h"

#include <cstddef>
#include <cstdint>
#include <optional>
#include <vector>

namespace qf::zero {

// One raw edit of a collection, as logged by change tracking. `position` is the
// item's index in a sequence; `key` its key in a map.
struct ModelElement::Impl::CollectionEdit {
  enum class Kind : std::uint8_t { Inserted, Erased };
  Kind kind;
  std::size_t position;
  Value item;
  MapKey key;
};

// Takes `edits` back from `items`, the contents of a positional collection, last edit
// first: what the contents were before the edits.
void undoInSequence(std::vector<Value>& items, const std::vector<ModelElement::Impl::CollectionEdit>& edits);

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

  // Slots, written by Impl::copyValue. A collection's slot holds either its old
  // contents or the log of its edits since the level began.
  void setOldValue(int index, Value value);
  void setOldCollection(int index, std::vector<Value> items);
  void startEditLog(int index);
  bool holdsSlot(int index) const;
  bool holdsCollection(int index) const;
  bool holdsEditLog(int index) const;
  const Value& oldValue(int index) const;
  const std::vector<Value>& oldCollection(int index) const;
  // The edit log of collection `index`; null when the slot holds contents instead.
  std::vector<CollectionEdit>* editLog(int index);
  const std::vector<CollectionEdit>& editLogOf(int index) const;
  // Replaces every edit log by the old contents it stands for, taken from `element`'s
  // current collections: what a change report reads. Costs one copy of each changed
  // collection; a second call finds nothing to do.
  void materialize(Impl* element);

  // The old value of `property`: a list value for a many-valued one.
  // REQUIRES: isChanged(property index).
  virtual Value getOldValue(const meta::Property& property, AccessTag tag = AccessTag::Default) const;
  // Clears the bit of every property whose current value in `element` equals the old one.
  // Materializes first.
  virtual void revertUnchanged(Impl* element);

  void setOldContainer(const ModelElement& container, const meta::Property& feature);
  const ModelElement& getOldContainer() const noexcept { return oldContainer_; }
  const meta::Property& getOldContainmentFeature() const noexcept { return oldFeature_; }

  // Savepoint commit: moves into `outer` (the same element's record one level out)
  // every slot that `outer` does not hold yet, and appends this level's edit logs to
  // the logs `outer` holds.
  virtual void mergeInto(Storage& outer);

 private:
  enum class SlotKind : std::uint8_t { Empty, Value, Contents, EditLog };
  struct Slot {
    Value value;
    std::vector<Value> items;
    std::vector<CollectionEdit> edits;
    SlotKind kind = SlotKind::Empty;
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
