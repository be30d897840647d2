#include "collection_view.h"

#include "qf/zero/core/owned_collection.h"
#include "values.h"

namespace py = pybind11;
using qf::zero::Value;

namespace kiv::python {

CollectionView::CollectionView(qf::zero::ModelElement owner, qf::zero::meta::Property property)
    : owner_(std::move(owner)), property_(std::move(property)) {}

qf::zero::GenericCollectionInterface& CollectionView::collection() const {
  return *owner_.getPropertyValue(property_).getValue<qf::zero::AbstractOwnedCollection*>();
}

bool CollectionView::isSequence() const { return collection().isSequenceInterface(); }
bool CollectionView::isMap() const { return collection().isMapInterface(); }

std::size_t CollectionView::size() const { return collection().size(); }

std::size_t CollectionView::position(std::ptrdiff_t index, bool end) const {
  const auto count = static_cast<std::ptrdiff_t>(size());
  if (index < 0) index += count;
  if (index < 0 || index > count || (index == count && !end)) throw py::index_error("index out of range");
  return static_cast<std::size_t>(index);
}

py::object CollectionView::at(std::ptrdiff_t index) const {
  return toPython(collection().genericAt(position(index, false)), property_);
}

py::list CollectionView::items() const {
  py::list items;
  const auto& all = collection();
  for (std::size_t i = 0; i < all.size(); ++i) items.append(toPython(all.genericAt(i), property_));
  return items;
}

bool CollectionView::contains(const py::handle& item) const {
  Value value;
  try {
    value = fromPython(item, property_);
  } catch (const py::error_already_set&) {
    return false;
  } catch (const py::builtin_exception&) {
    return false;
  }
  return collection().genericIndexOf(value).has_value();
}

void CollectionView::add(const py::handle& item) { collection().genericAdd(fromPython(item, property_)); }

void CollectionView::insert(std::ptrdiff_t index, const py::handle& item) {
  auto* sequence = dynamic_cast<qf::zero::GenericSequenceInterface*>(&collection());
  if (sequence == nullptr || !isSequence()) throw py::type_error("only a sequence inserts at a position");
  sequence->genericInsert(position(index, true), fromPython(item, property_));
}

void CollectionView::remove(const py::handle& item) {
  if (!collection().genericRemove(fromPython(item, property_)))
    throw py::value_error("item not in the collection");
}

void CollectionView::removeAt(std::ptrdiff_t index) {
  auto* sequence = dynamic_cast<qf::zero::GenericSequenceInterface*>(&collection());
  if (sequence == nullptr || !isSequence()) throw py::type_error("only a sequence removes at a position");
  sequence->genericRemoveAt(position(index, false));
}

void CollectionView::clear() { collection().genericClear(); }

void CollectionView::replace(const std::vector<Value>& items) {
  auto& all = collection();
  all.genericClear();
  for (const Value& item : items) all.genericAdd(item);
}

py::object CollectionView::find(const py::handle& key) const {
  auto* map = dynamic_cast<qf::zero::GenericMapInterface*>(&collection());
  if (map == nullptr || !isMap()) throw py::type_error("only a map finds items by key");
  return toPython(map->genericFind(fromPython(key, property_->getQualifiedBy())), property_);
}

}  // namespace kiv::python
