// The value of a many-valued property: a collection owned by one element's property.
//
// Every change runs inside an `Operation` (a transaction of the owner's model, joined
// when one is open) and records the owner's old contents first, so collections take
// part in change reports and rollback like single values.
#pragma once

#include "qf/zero/core/generic_collection.h"
#include "qf/zero/core/internal/element_impl.h"
#include "qf/zero/core/meta/property.h"
#include "qf/zero/core/transaction.h"
#include "qf/zero/core/value.h"

#include <vector>

namespace qf::zero {

// The collection of one element's many-valued property: every change is checked, runs in a
// transaction of the owner's model and is recorded for change reports and rollback.
class AbstractOwnedCollection : public GenericCollectionInterface {
 public:
  AbstractOwnedCollection(ModelElement::Impl* owner, meta::Property property)
      : owner_(owner), property_(std::move(property)) {}
  ~AbstractOwnedCollection() override = default;
  AbstractOwnedCollection(const AbstractOwnedCollection&) = delete;
  AbstractOwnedCollection& operator=(const AbstractOwnedCollection&) = delete;

  ModelElement::Impl* getOwner() const noexcept { return owner_; }
  const meta::Property& getCollectionProperty() const noexcept { return property_; }
  // Change tracking; call before each raw edit. Returns the log to append the edit to
  // once made, or null when none is kept (see ModelElement::Impl::notifyCollectionModifying).
  std::vector<ModelElement::Impl::CollectionEdit>* modifying();

  // The guard around every change: checks the owner may change and opens a
  // transaction; commit() at the end, or the changes roll back.
  class Operation {
   public:
    explicit Operation(AbstractOwnedCollection& collection);
    void commit();

   private:
    Transaction transaction_;
  };

  // Raw snapshot and restore, used by change tracking. restore keeps the incoming
  // index of reference targets; it neither checks nor records.
  virtual std::vector<Value> snapshot() const = 0;
  virtual void restore(const std::vector<Value>& items) = 0;
  // Raw: takes back `edits`, the log of this collection's edits since some earlier
  // state, last edit first; the collection is in that state again.
  virtual void undo(const std::vector<ModelElement::Impl::CollectionEdit>& edits) = 0;
  // The contents the collection had before `edits`, as snapshot() gave them then
  // (a map's items in key order; an unordered set's in an unspecified order). Changes
  // nothing.
  virtual std::vector<Value> contentsBefore(
      const std::vector<ModelElement::Impl::CollectionEdit>& edits) const = 0;
  // Equal to a snapshot: in order for sequences, as multisets otherwise.
  virtual bool sameContents(const std::vector<Value>& items) const = 0;

 protected:
  ModelElement::Impl* owner_;
  meta::Property property_;
};

}  // namespace qf::zero
