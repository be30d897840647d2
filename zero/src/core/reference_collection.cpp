#include "qf/zero/core/reference_collection.h"

#include "qf/zero/core/internal/storage.h"
#include "qf/zero/core/messages.h"
#include "qf/zero/core/meta/structured_type.h"
#include "qf/zero/core/model_impl.h"
#include "qf/zero/core/report_exception.h"

#include <algorithm>
#include <unordered_map>
#include <utility>

namespace qf::zero {

using CollectionEdit = ModelElement::Impl::CollectionEdit;

bool ReferenceCollection::isComposite() const { return property_->isContainment(); }
bool ReferenceCollection::isSequenceInterface() const noexcept { return property_->isSequence(); }
bool ReferenceCollection::isMapInterface() const noexcept { return property_->isMap(); }

MapKey ReferenceCollection::keyOf(const ModelElement& element) const {
  const meta::Property key = property_->getQualifiedBy();
  if (!key || !element || element.isProxy()) return MapKey();
  return element->basicGetMapKey(key);
}

void ReferenceCollection::insert(std::size_t position, const ModelElement& element) {
  Operation operation(*this);
  if (!element) reportException(qf0::messages::CannotAddNonExistentObject());
  owner_->checkReferenceAssignable(property_, element);
  if (property_->isMap()) {
    if (ModelElement holder = basicFindByKey(keyOf(element)); holder) {
      if (holder == element) reportException(qf0::messages::CannotAddSecondObject());
      reportException(qf0::messages::UniquenessConstraint());
    }
  } else if ((property_->isUnique() || property_->isSet()) && basicContains(element.getImpl())) {
    reportException(qf0::messages::CannotAddSecondObject());
  }
  if (position != npos && position > size()) {
    reportException(qf0::messages::IndexOutOfRange(static_cast<std::int64_t>(position),
                                                   static_cast<std::int64_t>(size())));
  }
  const meta::Property opposite = property_->getOpposite();
  if (opposite && opposite->isMap() && !element.isProxy()) {
    auto* map = static_cast<ReferenceCollection*>(element->basicGetCollection(opposite));
    if (ModelElement holder = map->basicFindByKey(map->keyOf(ModelElement(owner_)));
        holder && holder.getImpl() != owner_) {
      reportException(qf0::messages::UniquenessConstraint());
    }
  }
  owner_->linkTo(property_, element, position);
  operation.commit();
}

void ReferenceCollection::addAll(const std::vector<ModelElement>& elements) {
  Operation operation(*this);
  // Containment and opposite ends need the whole of insert for each element.
  if (!property_->isMap() || isComposite() || property_->getOpposite()) {
    for (const ModelElement& element : elements) insert(npos, element);
    operation.commit();
    return;
  }
  for (const ModelElement& element : elements) {
    if (!element) reportException(qf0::messages::CannotAddNonExistentObject());
    owner_->checkReferenceAssignable(property_, element);
    MapKey key = keyOf(element);
    if (ModelElement holder = basicFindByKey(key); holder) {
      if (holder == element) reportException(qf0::messages::CannotAddSecondObject());
      reportException(qf0::messages::UniquenessConstraint());
    }
    std::vector<CollectionEdit>* log = modifying();
    const std::size_t at = size();
    if (!basicInsertUnderKey(element, key)) continue;
    element->basicLinkIncoming(owner_, property_);
    if (log != nullptr)
      log->push_back({CollectionEdit::Kind::Inserted, at, Value::of(element), std::move(key)});
  }
  operation.commit();
}

bool ReferenceCollection::basicInsertUnderKey(const ModelElement& element, const MapKey&) {
  return basicInsert(npos, element);
}

bool ReferenceCollection::remove(const ModelElement& element) {
  if (!element || !basicContains(element.getImpl())) return false;
  Operation operation(*this);
  owner_->unlinkFrom(property_, element);
  operation.commit();
  return true;
}

void ReferenceCollection::removeAt(std::size_t position) {
  if (position >= size()) {
    reportException(qf0::messages::IndexOutOfRange(static_cast<std::int64_t>(position),
                                                   static_cast<std::int64_t>(size())));
  }
  remove(basicAt(position));
}

void ReferenceCollection::clear() {
  if (size() == 0) return;
  Operation operation(*this);
  for (const ModelElement& element : getAllValuesAndProxies()) owner_->unlinkFrom(property_, element);
  operation.commit();
}

std::vector<ModelElement> ReferenceCollection::getAllValuesAndProxies() const {
  std::vector<ModelElement> result;
  result.reserve(size());
  basicForEach([&](const ModelElement& element) { result.push_back(element); });
  return result;
}

std::vector<ModelElement> ReferenceCollection::getAllValues() const {
  std::vector<ModelElement> result;
  result.reserve(size());
  basicForEach([&](const ModelElement& element) { result.push_back(peekResolveProxy(element)); });
  return result;
}

ModelElement ReferenceCollection::resolveProxy(const ModelElement& element) const {
  if (!element.isProxy() || owner_->getModelImpl() == nullptr) return element;
  return owner_->getModelImpl()->resolveProxy(owner_, element);
}

ModelElement ReferenceCollection::peekResolveProxy(const ModelElement& element) const {
  if (!element.isProxy() || owner_->getModelImpl() == nullptr) return element;
  ModelElement resident = owner_->getModelImpl()->peekResolveProxy(owner_, element);
  return resident ? resident : element;
}

void ReferenceCollection::checkCompatibleModel(const ModelElement& element) const {
  owner_->checkCompatibleModel(element.getImpl(), property_);
}

void ReferenceCollection::basicAddWithProxy(const ModelElement& proxy) {
  if (!proxy.isProxy()) reportException(qf0::messages::InvalidValue());
  rawInsert(npos, proxy);
}

void ReferenceCollection::replaceProxy(const ModelElement& proxy, const ModelElement& resident) {
  if (!basicContains(proxy.getImpl())) return;
  if (property_->isSequence()) {
    const std::size_t position = *basicIndexOf(proxy.getImpl());
    rawErase(proxy.getImpl());
    rawInsert(position, resident);
  } else {
    rawErase(proxy.getImpl());
    rawInsert(npos, resident);
  }
}

bool ReferenceCollection::removeProxy(const ProxyId& id) {
  for (const ModelElement& element : getAllValuesAndProxies()) {
    if (element.isProxy() && element->getProxyId().elementId == id.elementId)
      return rawErase(element.getImpl());
  }
  return false;
}

void ReferenceCollection::resolveAll() {
  for (const ModelElement& element : getAllValuesAndProxies()) {
    if (!element.isProxy()) continue;
    if (ModelElement resident = peekResolveProxy(element); !resident.isProxy())
      replaceProxy(element, resident);
  }
}

bool ReferenceCollection::basicContainsProxyTo(const ProxyId& id) const {
  bool found = false;
  basicForEach([&](const ModelElement& element) {
    found = found || (element.isProxy() && element->getProxyId().elementId == id.elementId);
  });
  return found;
}

bool ReferenceCollection::rawInsert(std::size_t position, const ModelElement& element) {
  if (!basicInsert(position, element)) return false;
  if (!isComposite()) element->basicLinkIncoming(owner_, property_);
  return true;
}

bool ReferenceCollection::rawErase(const ModelElement::Impl* element) {
  if (!basicErase(element)) return false;
  if (!isComposite()) const_cast<ModelElement::Impl*>(element)->basicUnlinkIncoming(owner_, property_);
  return true;
}

bool ReferenceCollection::rawEraseAt(std::size_t position) {
  if (position >= size()) return false;
  if (!isPositional()) return rawErase(basicAt(position).getImpl());
  const ModelElement element = basicAt(position);
  basicEraseAt(position);
  if (!isComposite()) element->basicUnlinkIncoming(owner_, property_);
  return true;
}

// The edit is logged only when this level keeps a log: an element made at this level, the
// common case while a history is recorded, pays for no key or value.
bool ReferenceCollection::recordedInsert(std::size_t position, const ModelElement& element) {
  std::vector<CollectionEdit>* log = modifying();
  const std::size_t at = isPositional() && position < size() ? position : size();
  if (log == nullptr) return rawInsert(at, element);
  const MapKey key = property_->isMap() ? keyOf(element) : MapKey();
  if (!rawInsert(at, element)) return false;
  log->push_back({CollectionEdit::Kind::Inserted, at, Value::of(element), key});
  return true;
}

bool ReferenceCollection::recordedErase(const ModelElement::Impl* element) {
  if (!basicContains(element)) return false;
  std::vector<CollectionEdit>* log = modifying();
  const ModelElement handle(const_cast<ModelElement::Impl*>(element));
  std::size_t position = 0;
  MapKey key;
  if (isPositional()) {
    position = basicIndexOf(element).value_or(0);
    rawEraseAt(position);
  } else {
    if (log != nullptr && property_->isMap()) key = keyOf(handle);
    rawErase(element);
  }
  if (log != nullptr)
    log->push_back({CollectionEdit::Kind::Erased, position, Value::of(handle), std::move(key)});
  return true;
}

void ReferenceCollection::rawClear() {
  if (!isComposite()) {
    basicForEach([&](const ModelElement& element) { element->basicUnlinkIncoming(owner_, property_); });
  }
  basicClear();
}

ModelElement ReferenceCollection::basicFindByKey(const MapKey&) const { return ModelElement(); }

std::optional<std::size_t> ReferenceCollection::basicIndexOf(const ModelElement::Impl* element) const {
  std::size_t index = 0;
  std::optional<std::size_t> found;
  basicForEach([&](const ModelElement& e) {
    if (!found && e.getImpl() == element) found = index;
    ++index;
  });
  return found;
}

Value ReferenceCollection::genericAt(std::size_t index) const {
  if (index >= size()) {
    reportException(
        qf0::messages::IndexOutOfRange(static_cast<std::int64_t>(index), static_cast<std::int64_t>(size())));
  }
  return Value::createElementValue(basicAt(index), property_);
}

void ReferenceCollection::genericAdd(const Value& value) {
  if (!value.isElement()) reportException(qf0::messages::CannotAddNonExistentObject());
  add(value.getElement());
}

bool ReferenceCollection::genericRemove(const Value& value) {
  return value.isElement() && remove(value.getElement());
}

std::optional<std::size_t> ReferenceCollection::genericIndexOf(const Value& value) const {
  if (!value.isElement()) return std::nullopt;
  return basicIndexOf(value.getElement().getImpl());
}

void ReferenceCollection::genericInsert(std::size_t index, const Value& value) {
  if (!value.isElement()) reportException(qf0::messages::CannotAddNonExistentObject());
  insert(property_->isSequence() ? index : npos, value.getElement());
}

void ReferenceCollection::genericReplace(std::size_t index, const Value& value) {
  if (index >= size()) {
    reportException(
        qf0::messages::IndexOutOfRange(static_cast<std::int64_t>(index), static_cast<std::int64_t>(size())));
  }
  Transaction transaction = owner_->getModelImpl()->beginTransaction(true);
  removeAt(index);
  genericInsert(index, value);
  transaction.commit();
}

void ReferenceCollection::genericEnsureAt(std::size_t index) {
  // References have no default to grow with.
  if (index >= size()) reportException(qf0::messages::InvalidValue());
}

Value ReferenceCollection::genericFind(const Value& key) const {
  if (!property_->isMap()) reportException(qf0::messages::InvalidValue());
  ModelElement element = basicFindByKey(mapKeyFromValue(key));
  return element ? Value::createElementValue(element, property_) : Value();
}

std::vector<Value> ReferenceCollection::snapshot() const {
  std::vector<Value> items;
  items.reserve(size());
  basicForEach([&](const ModelElement& element) { items.push_back(Value::of(element)); });
  return items;
}

void ReferenceCollection::restore(const std::vector<Value>& items) {
  rawClear();
  for (const Value& item : items) rawInsert(npos, item.getElement());
}

void ReferenceCollection::undo(const std::vector<CollectionEdit>& edits) {
  for (auto edit = edits.rbegin(); edit != edits.rend(); ++edit) {
    const ModelElement& element = edit->item.getElement();
    if (edit->kind == CollectionEdit::Kind::Erased) {
      rawInsert(isPositional() ? edit->position : npos, element);
    } else if (isPositional()) {
      rawEraseAt(edit->position);
    } else if (!rawErase(element.getImpl())) {
      // A proxy logged here may have been replaced, unrecorded, by its resident
      // element: both stand for the same reference.
      for (const ModelElement& held : getAllValuesAndProxies()) {
        if (held->getUuid() == element->getUuid()) {
          rawErase(held.getImpl());
          break;
        }
      }
    }
  }
}

std::vector<Value> ReferenceCollection::contentsBefore(const std::vector<CollectionEdit>& edits) const {
  std::vector<Value> items = snapshot();
  if (isPositional()) {
    undoInSequence(items, edits);
    return items;
  }
  // A set or map holds an item at most once: it was there before the edits when its
  // first edit took it out, or when no edit touched it.
  std::unordered_map<const ModelElement::Impl*, const CollectionEdit*> firstEdit;
  for (const CollectionEdit& edit : edits) firstEdit.emplace(edit.item.getElement().getImpl(), &edit);
  std::vector<std::pair<MapKey, Value>> before;
  before.reserve(items.size());
  const bool map = property_->isMap();
  for (Value& item : items) {
    const ModelElement& element = item.getElement();
    if (firstEdit.count(element.getImpl()) != 0) continue;
    before.emplace_back(map ? keyOf(element) : MapKey(), std::move(item));
  }
  for (const CollectionEdit& edit : edits) {
    if (edit.kind == CollectionEdit::Kind::Erased && firstEdit[edit.item.getElement().getImpl()] == &edit) {
      before.emplace_back(edit.key, edit.item);
    }
  }
  if (map) {
    std::stable_sort(before.begin(), before.end(),
                     [](const auto& left, const auto& right) { return left.first < right.first; });
  }
  items.clear();
  for (auto& [key, item] : before) items.push_back(std::move(item));
  return items;
}

bool ReferenceCollection::sameContents(const std::vector<Value>& items) const {
  if (items.size() != size()) return false;
  if (property_->isSequence()) {
    std::size_t index = 0;
    bool same = true;
    basicForEach([&](const ModelElement& element) { same = same && items[index++].getElement() == element; });
    return same;
  }
  for (const Value& item : items) {
    if (!basicContains(item.getElement().getImpl())) return false;
  }
  return true;
}

}  // namespace qf::zero
