// Primitive collections: the value of a many-valued property typed by a primitive,
// enumeration or datatype. PrimitiveSequence<T> keeps order and duplicates;
// PrimitiveSet<T> keeps each value once, in insertion order.
#pragma once

#include "qf/zero/core/owned_collection.h"

#include <algorithm>
#include <vector>

namespace qf::zero {

// The collection of a many-valued property typed by a primitive, enumeration or datatype:
// items are checked against the property's type, and every change is recorded.
class PrimitiveCollection : public AbstractOwnedCollection, public GenericSequenceInterface {
 public:
  using AbstractOwnedCollection::AbstractOwnedCollection;
  virtual std::vector<Value> getAllValues() const = 0;
  // Replaces the contents, recorded.
  void copyValues(const std::vector<Value>& values);
  virtual bool isUnique() const noexcept = 0;

  Value genericAt(std::size_t index) const override;
  void genericAdd(const Value& value) override { genericInsert(size(), value); }
  bool genericRemove(const Value& value) override;
  std::optional<std::size_t> genericIndexOf(const Value& value) const override;
  void genericClear() override;
  bool isSequenceInterface() const noexcept override { return !isUnique(); }
  void genericInsert(std::size_t index, const Value& value) override;
  void genericRemoveAt(std::size_t index) override;
  void genericReplace(std::size_t index, const Value& value) override;
  void genericEnsureAt(std::size_t index) override;

  std::vector<Value> snapshot() const override { return getAllValues(); }
  void undo(const std::vector<ModelElement::Impl::CollectionEdit>& edits) override;
  std::vector<Value> contentsBefore(
      const std::vector<ModelElement::Impl::CollectionEdit>& edits) const override;
  bool sameContents(const std::vector<Value>& items) const override;

 protected:
  // Raises "InvalidValue" unless `value` fits the property's type.
  void checkItem(const Value& value) const;
  // Raw edits that change tracking records.
  void recordedInsertValue(std::size_t index, const Value& value);
  void recordedEraseAt(std::size_t index);
  void recordedClear();
  // REQUIRES: index < size().
  virtual Value basicValueAt(std::size_t index) const = 0;
  virtual void basicInsertValue(std::size_t index, const Value& value) = 0;
  virtual void basicEraseAt(std::size_t index) = 0;
  virtual void basicClearValues() = 0;
};

// Values of T in insertion order: a sequence keeps duplicates, a set (Unique) keeps each
// value once.
template <class T, bool Unique>
class PrimitiveCollectionOf : public PrimitiveCollection {
 public:
  using PrimitiveCollection::PrimitiveCollection;

  std::size_t size() const override { return items_.size(); }
  bool isUnique() const noexcept override { return Unique; }
  const std::vector<T>& values() const noexcept { return items_; }
  const T& at(std::size_t index) const { return items_.at(index); }
  bool contains(const T& value) const {
    return std::find(items_.begin(), items_.end(), value) != items_.end();
  }

  // Checked and recorded. For a set, inserting a value it holds does nothing.
  void push_back(const T& value) { genericInsert(items_.size(), toValue(value)); }
  void insert(const T& value) { push_back(value); }
  bool erase(const T& value) { return genericRemove(toValue(value)); }
  void clear() { genericClear(); }

  std::vector<Value> getAllValues() const override {
    std::vector<Value> result;
    result.reserve(items_.size());
    for (const T& item : items_) result.push_back(toValue(item));
    return result;
  }
  void restore(const std::vector<Value>& items) override {
    items_.clear();
    for (const Value& item : items) items_.push_back(fromValue(item));
  }

 protected:
  void basicInsertValue(std::size_t index, const Value& value) override {
    items_.insert(items_.begin() + static_cast<std::ptrdiff_t>(std::min(index, items_.size())),
                  fromValue(value));
  }
  void basicEraseAt(std::size_t index) override {
    items_.erase(items_.begin() + static_cast<std::ptrdiff_t>(index));
  }
  void basicClearValues() override { items_.clear(); }
  Value basicValueAt(std::size_t index) const override { return toValue(items_[index]); }

 private:
  Value toValue(const T& item) const {
    if constexpr (std::is_same_v<T, Value>) {
      return item;
    } else {
      return Value::of(item, ValueMeta(getCollectionProperty()));
    }
  }
  static T fromValue(const Value& value) {
    if constexpr (std::is_same_v<T, Value>) {
      return value;
    } else {
      return value.getValue<T>();
    }
  }

  std::vector<T> items_;
};

template <class T>
using PrimitiveSequence = PrimitiveCollectionOf<T, false>;
template <class T>
using PrimitiveSet = PrimitiveCollectionOf<T, true>;

}  // namespace qf::zero
