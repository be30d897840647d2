// A live view of one many-valued property of one element: reading it reads the element
// now, changing it changes the element (inside the caller's transaction, as any edit).
// Sequences index like lists; sets and maps iterate in the model's order; a map's items
// are found by their key.
#pragma once

#include "qf/zero/core/generic_collection.h"
#include "qf/zero/core/meta/property.h"
#include "qf/zero/core/model_element.h"
#include "qf/zero/core/value.h"

#include <pybind11/pybind11.h>

#include <cstddef>
#include <vector>

namespace kiv::python {

class CollectionView {
 public:
  CollectionView(qf::zero::ModelElement owner, qf::zero::meta::Property property);

  std::size_t size() const;
  pybind11::object at(std::ptrdiff_t index) const;
  pybind11::list items() const;
  bool contains(const pybind11::handle& item) const;
  void add(const pybind11::handle& item);
  void insert(std::ptrdiff_t index, const pybind11::handle& item);
  // Raises ValueError when the item is not there.
  void remove(const pybind11::handle& item);
  void removeAt(std::ptrdiff_t index);
  void clear();
  void replace(const std::vector<qf::zero::Value>& items);
  // For a map: the item whose key property holds `key`, or None.
  pybind11::object find(const pybind11::handle& key) const;
  bool isSequence() const;
  bool isMap() const;
  const qf::zero::meta::Property& property() const { return property_; }

 private:
  qf::zero::GenericCollectionInterface& collection() const;
  std::size_t position(std::ptrdiff_t index, bool end) const;

  qf::zero::ModelElement owner_;
  qf::zero::meta::Property property_;
};

}  // namespace kiv::python
