// Reference collections: the value of a many-valued property typed by a class.
//
// ReferenceCollection holds the checked, recorded operations (containment, opposites,
// uniqueness, map keys, proxies); TypedReferenceCollection<T, C> stores the handles in
// a std::vector (ordered sequence), std::unordered_set (unordered set) or std::map
// keyed by a property of the target.
#pragma once

#include "qf/zero/core/internal/flat_table.h"
#include "qf/zero/core/map_key.h"
#include "qf/zero/core/owned_collection.h"

#include <cstddef>
#include <functional>
#include <map>
#include <unordered_map>
#include <unordered_set>
#include <vector>

namespace qf::zero {

// The collection of a many-valued property typed by a class: every change is checked
// (containment, opposite ends, uniqueness, map keys) and recorded.
class ReferenceCollection : public AbstractOwnedCollection,
                            public GenericSequenceInterface,
                            public GenericMapInterface {
 public:
  using AbstractOwnedCollection::AbstractOwnedCollection;
  static constexpr std::size_t npos = static_cast<std::size_t>(-1);

  bool isComposite() const;

  // Checked and recorded. add appends to a sequence; "CannotAddSecondObject" when a
  // unique collection holds the element already, "UniquenessConstraint" when a map
  // holds another element under its key.
  void add(const ModelElement& element) { insert(npos, element); }
  // add() of each element in turn, in one step: raises what add() would for the first
  // element refused, and then adds none. A map without containment or opposite end takes
  // each element with one look-up of its key, none when the keys rise past the last one.
  void addAll(const std::vector<ModelElement>& elements);
  void insert(std::size_t position, const ModelElement& element);
  // False when the element is not there.
  bool remove(const ModelElement& element);
  void removeAt(std::size_t position);
  void clear();
  bool contains(const ModelElement& element) const { return basicContains(element.getImpl()); }

  // Every entry in iteration order, proxies as they are.
  std::vector<ModelElement> getAllValuesAndProxies() const;
  // Every entry, proxies replaced by their resident element where there is one.
  std::vector<ModelElement> getAllValues() const;
  ModelElement resolveProxy(const ModelElement& element) const;
  ModelElement peekResolveProxy(const ModelElement& element) const;
  void checkCompatibleModel(const ModelElement& element) const;

  // Proxies: added and replaced without notification, since a proxy and its resident
  // element stand for the same reference.
  void basicAddWithProxy(const ModelElement& proxy);
  void replaceProxy(const ModelElement& proxy, const ModelElement& resident);
  bool removeProxy(const ProxyId& id);
  // Replaces every proxy whose element is resident.
  void resolveAll();
  bool basicContainsProxyTo(const ProxyId& id) const;

  // Raw access, no checks, no recording; the incoming index of targets is kept.
  bool rawInsert(std::size_t position, const ModelElement& element);
  bool rawErase(const ModelElement::Impl* element);
  // In a positional collection, the item at `position`; otherwise that item wherever it is.
  bool rawEraseAt(std::size_t position);
  void rawClear();
  // Raw edits that change tracking records: no checks, no opposite end, no containment.
  // False (nothing recorded) when the edit does nothing.
  bool recordedInsert(std::size_t position, const ModelElement& element);
  bool recordedErase(const ModelElement::Impl* element);

  // The concrete container. A positional one (a sequence) keeps items where they were
  // inserted; the others order them themselves (by key, or not at all).
  virtual bool isPositional() const noexcept = 0;
  virtual bool basicContains(const ModelElement::Impl* element) const = 0;
  virtual ModelElement basicAt(std::size_t index) const = 0;
  virtual void basicForEach(const std::function<void(const ModelElement&)>& visit) const = 0;
  // For maps: the element under `key`; null otherwise.
  virtual ModelElement basicFindByKey(const MapKey& key) const;
  virtual std::optional<std::size_t> basicIndexOf(const ModelElement::Impl* element) const;

  // GenericCollectionInterface, GenericSequenceInterface, GenericMapInterface.
  Value genericAt(std::size_t index) const override;
  void genericAdd(const Value& value) override;
  bool genericRemove(const Value& value) override;
  std::optional<std::size_t> genericIndexOf(const Value& value) const override;
  void genericClear() override { clear(); }
  bool isSequenceInterface() const noexcept override;
  bool isMapInterface() const noexcept override;
  void genericInsert(std::size_t index, const Value& value) override;
  void genericRemoveAt(std::size_t index) override { removeAt(index); }
  void genericReplace(std::size_t index, const Value& value) override;
  void genericEnsureAt(std::size_t index) override;
  Value genericFind(const Value& key) const override;

  std::vector<Value> snapshot() const override;
  void restore(const std::vector<Value>& items) override;
  void undo(const std::vector<ModelElement::Impl::CollectionEdit>& edits) override;
  std::vector<Value> contentsBefore(
      const std::vector<ModelElement::Impl::CollectionEdit>& edits) const override;
  bool sameContents(const std::vector<Value>& items) const override;

  // The key of `element` in a map: the value of the property qualifying this one.
  MapKey keyOf(const ModelElement& element) const;

 protected:
  virtual bool basicInsert(std::size_t position, const ModelElement& element) = 0;
  // basicInsert at the end, for a map: `key` is keyOf(element), computed already.
  virtual bool basicInsertUnderKey(const ModelElement& element, const MapKey& key);
  virtual bool basicErase(const ModelElement::Impl* element) = 0;
  // REQUIRES: isPositional(), position < size().
  virtual void basicEraseAt(std::size_t position) = 0;
  virtual void basicClear() = 0;
};

namespace internal {

// How a TypedReferenceCollection stores handles in container C.
template <class T, class C>
struct ReferenceStore;

template <class T>
struct ReferenceStore<T, std::vector<T>> {
  static constexpr bool ordered = true;
  static constexpr bool keyed = false;
  std::vector<T> items;
  FlatTable<const ModelElement::Impl*, std::size_t> counts;  // fast membership: occurrences

  bool contains(const ModelElement::Impl* e) const { return counts.find(e) != nullptr; }
  bool insert(std::size_t position, const T& e, const MapKey&) {
    items.insert(
        position >= items.size() ? items.end() : items.begin() + static_cast<std::ptrdiff_t>(position), e);
    if (std::size_t* count = counts.find(e.getImpl())) {
      ++*count;
    } else {
      counts.tryInsert(e.getImpl(), 1);
    }
    return true;
  }
  bool erase(const ModelElement::Impl* e) {
    if (!uncount(e)) return false;
    items.erase(std::find_if(items.begin(), items.end(), [e](const T& x) { return x.getImpl() == e; }));
    return true;
  }
  void eraseAt(std::size_t position) {
    const auto it = items.begin() + static_cast<std::ptrdiff_t>(position);
    uncount(it->getImpl());
    items.erase(it);
  }
  // One occurrence fewer of `e`; false when it had none.
  bool uncount(const ModelElement::Impl* e) {
    std::size_t* count = counts.find(e);
    if (count == nullptr) return false;
    if (*count == 1) {
      counts.erase(e);  // a zero count would mark the slot free before the table knew
    } else {
      --*count;
    }
    return true;
  }
  std::optional<std::size_t> indexOf(const ModelElement::Impl* e) const {
    if (!contains(e)) return std::nullopt;
    auto it = std::find_if(items.begin(), items.end(), [e](const T& x) { return x.getImpl() == e; });
    return static_cast<std::size_t>(it - items.begin());
  }
  ModelElement at(std::size_t i) const { return items.at(i); }
  void clear() {
    items.clear();
    counts.clear();
  }
  std::size_t size() const { return items.size(); }
  template <class F>
  void forEach(F&& f) const {
    for (const T& e : items) f(e);
  }
  ModelElement findByKey(const MapKey&) const { return {}; }
};

template <class T>
struct ReferenceStore<T, std::unordered_set<T>> {
  static constexpr bool ordered = false;
  static constexpr bool keyed = false;
  std::unordered_set<T> items;

  // Handles hash by identity, so a handle made from the implementation finds it.
  bool contains(const ModelElement::Impl* e) const { return items.count(handleOf(e)) != 0; }
  bool insert(std::size_t, const T& e, const MapKey&) { return items.insert(e).second; }
  bool erase(const ModelElement::Impl* e) { return items.erase(handleOf(e)) != 0; }
  static T handleOf(const ModelElement::Impl* e) { return T(const_cast<ModelElement::Impl*>(e)); }
  std::optional<std::size_t> indexOf(const ModelElement::Impl* e) const {
    std::size_t i = 0;
    for (const T& x : items) {
      if (x.getImpl() == e) return i;
      ++i;
    }
    return std::nullopt;
  }
  ModelElement at(std::size_t i) const {
    auto it = items.begin();
    std::advance(it, static_cast<std::ptrdiff_t>(i));
    return *it;
  }
  void clear() { items.clear(); }
  std::size_t size() const { return items.size(); }
  template <class F>
  void forEach(F&& f) const {
    for (const T& e : items) f(e);
  }
  ModelElement findByKey(const MapKey&) const { return {}; }
};

template <class T, class K>
struct ReferenceStore<T, std::map<K, T>> {
  static constexpr bool ordered = false;
  static constexpr bool keyed = true;
  std::map<K, T> items;

  // `key` is the item's current key, where it is normally stored: looked up first, then
  // the whole map is searched, for an item stored under another key (a proxy, or an item
  // whose key changed while it was held raw).
  bool contains(const ModelElement::Impl* e, const MapKey& key) const {
    return locate(e, key) != items.end();
  }
  // Keys past the last one (items added in key order, as a history writes its states) go
  // last without a walk down the tree.
  bool insert(std::size_t, const T& e, const MapKey& key) {
    K typed = mapKeyAs<K>(key);
    if (isPastLast(typed)) {
      items.emplace_hint(items.end(), std::move(typed), e);
      return true;
    }
    return items.emplace(std::move(typed), e).second;
  }
  bool isPastLast(const K& key) const { return items.empty() || items.rbegin()->first < key; }
  bool erase(const ModelElement::Impl* e, const MapKey& key) {
    auto it = locate(e, key);
    if (it == items.end()) return false;
    items.erase(it);
    return true;
  }
  typename std::map<K, T>::const_iterator locate(const ModelElement::Impl* e, const MapKey& key) const {
    if (auto hit = items.find(mapKeyAs<K>(key)); hit != items.end() && hit->second.getImpl() == e) return hit;
    return std::find_if(items.begin(), items.end(), [e](const auto& kv) { return kv.second.getImpl() == e; });
  }
  std::optional<std::size_t> indexOf(const ModelElement::Impl* e) const {
    std::size_t i = 0;
    for (const auto& kv : items) {
      if (kv.second.getImpl() == e) return i;
      ++i;
    }
    return std::nullopt;
  }
  ModelElement at(std::size_t i) const {
    auto it = items.begin();
    std::advance(it, static_cast<std::ptrdiff_t>(i));
    return it->second;
  }
  void clear() { items.clear(); }
  std::size_t size() const { return items.size(); }
  template <class F>
  void forEach(F&& f) const {
    for (const auto& kv : items) f(kv.second);
  }
  ModelElement findByKey(const MapKey& key) const {
    const K typed = mapKeyAs<K>(key);
    if (isPastLast(typed)) return {};
    auto it = items.find(typed);
    return it == items.end() ? ModelElement() : ModelElement(it->second);
  }
};

}  // namespace internal

// Keeps the targets as handles of T in C: a std::vector for a sequence, a std::unordered_set
// for a set, a std::map for a map keyed by a property of the target.
template <class T, class C>
class TypedReferenceCollection : public ReferenceCollection {
 public:
  using ReferenceCollection::ReferenceCollection;

  std::size_t size() const override { return store_.size(); }
  bool isPositional() const noexcept override { return internal::ReferenceStore<T, C>::ordered; }
  // The handles in iteration order, typed.
  std::vector<T> getTypedValues() const {
    std::vector<T> result;
    result.reserve(store_.size());
    store_.forEach([&](const T& e) { result.push_back(e); });
    return result;
  }
  const C& container() const noexcept { return store_.items; }

  bool basicContains(const ModelElement::Impl* element) const override {
    if constexpr (kKeyed) {
      return store_.contains(element, keyOfImpl(element));
    } else {
      return store_.contains(element);
    }
  }
  ModelElement basicAt(std::size_t index) const override { return store_.at(index); }
  void basicForEach(const std::function<void(const ModelElement&)>& visit) const override {
    store_.forEach([&](const T& e) { visit(e); });
  }
  ModelElement basicFindByKey(const MapKey& key) const override { return store_.findByKey(key); }
  std::optional<std::size_t> basicIndexOf(const ModelElement::Impl* element) const override {
    return store_.indexOf(element);
  }

 protected:
  bool basicInsert(std::size_t position, const ModelElement& element) override {
    T typed = elementCast<T>(element);
    const MapKey key = getCollectionProperty()->isMap() ? keyOf(element) : MapKey();
    return store_.insert(position, typed, key);
  }
  bool basicInsertUnderKey(const ModelElement& element, const MapKey& key) override {
    return store_.insert(npos, elementCast<T>(element), key);
  }
  bool basicErase(const ModelElement::Impl* element) override {
    if constexpr (kKeyed) {
      return store_.erase(element, keyOfImpl(element));
    } else {
      return store_.erase(element);
    }
  }
  void basicEraseAt(std::size_t position) override {
    if constexpr (internal::ReferenceStore<T, C>::ordered) {
      store_.eraseAt(position);
    } else {
      (void)position;
    }
  }
  void basicClear() override { store_.clear(); }

 private:
  static constexpr bool kKeyed = internal::ReferenceStore<T, C>::keyed;
  MapKey keyOfImpl(const ModelElement::Impl* element) const {
    return this->keyOf(ModelElement(const_cast<ModelElement::Impl*>(element)));
  }

  internal::ReferenceStore<T, C> store_;
};

// The same, for collections that may hold proxies. Proxies are ordinary entries of
// the container; the extra operations live in ReferenceCollection.
template <class T, class C>
class TypedReferenceCollectionWithProxies : public TypedReferenceCollection<T, C> {
 public:
  using TypedReferenceCollection<T, C>::TypedReferenceCollection;
  void addProxy(const ModelElement& proxy) { this->basicAddWithProxy(proxy); }
};

}  // namespace qf::zero
