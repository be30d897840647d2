// Reflective access to collections, whatever their element type.
#pragma once

#include "qf/zero/core/fwd.h"

#include <cstddef>
#include <optional>

namespace qf::zero {

// What the collection of any many-valued property offers reflectively: its size, items by
// position in iteration order, adding, removing and clearing, with the checks of its property.
class GenericCollectionInterface {
 public:
  virtual ~GenericCollectionInterface() = default;
  virtual std::size_t size() const = 0;
  // The item at `index` in iteration order; raises "IndexOutOfRange".
  virtual Value genericAt(std::size_t index) const = 0;
  // Raises "InvalidValue" for a value of the wrong kind, "CannotAddSecondObject" for
  // an item a unique collection holds already.
  virtual void genericAdd(const Value& value) = 0;
  // False when the item is not there.
  virtual bool genericRemove(const Value& value) = 0;
  virtual std::optional<std::size_t> genericIndexOf(const Value& value) const = 0;
  virtual void genericClear() = 0;
  virtual bool isSequenceInterface() const noexcept { return false; }
  virtual bool isMapInterface() const noexcept { return false; }
  virtual bool isMultimapInterface() const noexcept { return false; }
};

// Position-based access of ordered collections.
class GenericSequenceInterface {
 public:
  virtual ~GenericSequenceInterface() = default;
  virtual void genericInsert(std::size_t index, const Value& value) = 0;
  virtual void genericRemoveAt(std::size_t index) = 0;
  virtual void genericReplace(std::size_t index, const Value& value) = 0;
  // Grows a sequence of values with defaults so that `index` exists.
  virtual void genericEnsureAt(std::size_t index) = 0;
};

// Key-based access of maps keyed by a property of their items.
class GenericMapInterface {
 public:
  virtual ~GenericMapInterface() = default;
  // The item under `key`, or an empty value.
  virtual Value genericFind(const Value& key) const = 0;
};

}  // namespace qf::zero
