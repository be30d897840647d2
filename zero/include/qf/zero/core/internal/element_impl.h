// ModelElement::Impl: the state and behaviour shared by every element.
//
// An element class supplies a few raw hooks (read and store one property value,
// hand out one collection); the base class builds on them everything that keeps
// a model consistent: checked reflective access, containment, opposites, the
// incoming-reference index, change tracking with old-value storages, exact rollback,
// destruction of subtrees and proxies. Run-time classes use DynamicElementImpl;
// generated classes override the hooks with typed members.
//
// Every change goes through notifyModifying(index) before the value is touched;
// index 0 stands for the element's container, properties count from 1.
#pragma once

#include "qf/zero/core/fwd.h"
#include "qf/zero/core/map_key.h"
#include "qf/zero/core/model_element.h"
#include "qf/zero/core/proxy_id.h"
#include "qf/zero/core/ref_counted.h"
#include "qf/zero/core/uuid.h"

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace qf::zero {

namespace meta {
class PropertyImplAccess;
}

class ModelElement::Impl : public RefCounted {
 public:
  class Storage;
  class Changes;
  struct CollectionEdit;

  // The container pseudo-property of notifyModifying and Storage.
  static constexpr int kContainerIndex = 0;

  enum class State : std::uint8_t {
    Detached,   // made, not yet registered in a model
    Live,       // resident in its model
    Destroyed,  // destroyed, or its model is gone
    Proxy       // stands for an element that is not resident
  };

  static Uuid generateNewUuid() { return qf::zero::generateNewUuid(); }

  // Identity and model.
  const Uuid& getUuid() const noexcept { return uuid_; }
  std::string identifier() const;
  Model getModel() const;
  ModelImpl* getModelImpl() const noexcept { return model_; }
  virtual meta::Class getMetaClass() const = 0;
  State getState() const noexcept { return state_; }
  bool isLive() const noexcept { return state_ == State::Live; }
  bool isProxy() const noexcept { return state_ == State::Proxy; }
  bool isTopLevel() const noexcept { return state_ == State::Live && container_ == nullptr; }
  // Creation order within the model; fixes the order of top-level elements.
  std::uint64_t getSerial() const noexcept { return serial_; }

  ProxyId getProxyId() const;
  // The id under which other models may refer to this element.
  ProxyId getPersistentProxyId(bool withModelUri) const;

  // Containment.
  ModelElement container() const;
  Impl* containerImpl() const noexcept { return container_; }
  meta::Property containmentFeature() const;
  // Raises "CannotCreateCircularContainment" when `child` is this element or one of
  // its containers, i.e. when containing it here would close a cycle.
  void checkCircularContainment(const ModelElement& child) const;
  // Raises "CannotModifyProxy" when this element is a proxy: the first check of every
  // setter and mutable getter.
  void checkNotProxy() const;
  // Raises "CannotCreateCrossModelAssociation" when `target` lives in another model.
  void checkCompatibleModel(const Impl* target, const meta::Property& property) const;

  // Reflective access. The defaults work on any class through the raw hooks below.
  virtual Value getPropertyValue(const meta::Property& property, AccessTag tag = AccessTag::Default) const;
  virtual void setPropertyValue(const meta::Property& property, const Value& value,
                                AccessTag tag = AccessTag::Default);
  virtual bool hasPropertyValue(const meta::Property& property, AccessTag tag = AccessTag::Default) const;
  // The property whose value this element keeps in slot `index`. Named apart from
  // meta::Class's getPropertyByIndex: a class is an element too, and its own slots are not
  // the slots of the elements it describes.
  virtual meta::Property propertyForSlot(int index) const;
  // setPropertyValue's work. `initializing` (builders) lets read-only and set-once
  // properties take their first value.
  void assignValue(const meta::Property& property, const Value& value, bool initializing);
  virtual Value invoke(const meta::Operation& operation, std::vector<Value> arguments,
                       AccessTag tag = AccessTag::Default);

  // Opposite maintenance: add `source` to (remove it from) this element's property
  // `property`, which is the opposite of the property through which source refers
  // here. Records the change; does not touch source.
  void inverseAdd(const ModelElement& source, const meta::Property& property);
  void inverseRemove(const ModelElement& source, const meta::Property& property);
  bool inverseContainsProxyTo(const ProxyId& id, const meta::Property& property) const;

  // Change tracking: records the old value of property `index` (0: container) in this
  // transaction's storage the first time it changes. REQUIRES: an open transaction.
  // Raises when the model is frozen or the element is not live.
  void notifyModifying(int index);
  // The same for many-valued property `index`, before each raw edit of its collection:
  // returns the log the caller appends that edit to once made, or null when this level
  // keeps no log for it (the element was made at this level, or the level holds the
  // old contents instead).
  std::vector<CollectionEdit>* notifyCollectionModifying(int index);
  virtual std::unique_ptr<Storage> createStorage() const;
  // Copies the current value of property `index` (>= 1) into `storage`; for a
  // many-valued property, starts its edit log instead.
  virtual void copyValue(Storage* storage, int index) const;
  // Restores every property the storage holds, raw. Used by rollback.
  virtual void copyStateFromStorage(Storage* storage);
  // One half of copyStateFromStorage: single values and the container, or collections.
  // Rollback restores every element's single values before any collection, so that a
  // map keyed by a property of its items sees the restored keys.
  virtual void restoreFromStorage(Storage* storage, bool collections);

  // Destroys this element and its contained subtree in one transaction: references
  // to any of them are removed, their own references cleared, and this element leaves
  // its container. Rolled back exactly when the transaction is cancelled.
  void destroy();

  // Called on each element of a subtree that destroy() is about to remove, inside its
  // transaction and before any reference is cut, so that changes made here are undone
  // with a cancelled destruction. An element class releases here what it holds outside
  // the model (a listener on another model, for instance). The default does nothing.
  virtual void aboutToDestroy() {}

  // Raw hooks of an element class.
  // A single-valued property: its value (empty Value when unset).
  virtual Value basicGetValue(const meta::Property& property) const = 0;
  // Stores a single-valued property raw: no checks, no notification, no opposite.
  // Reference stores keep the incoming index of old and new target.
  virtual void basicSetValue(const meta::Property& property, const Value& value) = 0;
  // A many-valued property: its collection (never null for a many-valued property).
  virtual AbstractOwnedCollection* basicGetCollection(const meta::Property& property) const = 0;
  // A single JsonValue property that the element keeps as compact text: that text, so that a
  // writer of text copies it instead of parsing and writing it again. Null for any other
  // property (the default).
  virtual const JsonText* basicGetHeldText(const meta::Property& property) const;
  // Stores a property that basicGetHeldText answers from its compact text, as
  // assignValue(property, value of that text, initializing) would: checked, recorded and
  // notified, but neither parsed nor copied into a Value. `text` must be the compact text
  // of a JSON value. False, storing nothing, for any other property (the default).
  virtual bool assignHeldText(const meta::Property& property, JsonText text, bool initializing);
  // mapKeyFromValue(basicGetValue(property)), the key this element has in a map keyed by
  // `property`; typed classes read it from their member without making a Value.
  virtual MapKey basicGetMapKey(const meta::Property& property) const;
  // Every property of the class (inherited first), in index order.
  const std::vector<meta::Property>& allProperties() const;

  // Change watching, for a library that keeps data derived from some elements (an index):
  // it marks them watched, and the model counts every change and destruction of a watched
  // element (ModelImpl::getWatchedChangeCount), cancelled ones included; cancelling the
  // creation of an element counts only when proxies may have resolved to it. The mark is
  // not part of the element's state: no transaction records it.
  void setWatched(bool watched) noexcept { watched_ = watched; }
  bool isWatched() const noexcept { return watched_; }

  // Clears every reference of an element that is gone for good (destroyed and committed,
  // or its model deleted), so that no reference cycle keeps memory alive.
  virtual void invalidate();

  // The incoming-reference index: who refers to this element through a
  // non-containment reference. Maintained by the raw stores.
  struct IncomingReference {
    Impl* source;
    const void* property;  // meta::Property::Impl*, compared by identity
  };
  void basicLinkIncoming(Impl* source, const meta::Property& property);
  void basicUnlinkIncoming(Impl* source, const meta::Property& property);
  const std::vector<IncomingReference>& incomingReferences() const noexcept { return incoming_; }

  // Attaches a metamodel item to `model` (may be null) under `id`, outside any
  // transaction: metamodels are built once and not tracked.
  void adoptInto(ModelImpl* model, const Uuid& id);

  // Makes a proxy of class `metaClass` for `id`, referred to from `model`.
  static ModelElement createProxy(ModelImpl* model, const meta::Class& metaClass, const ProxyId& id);

 protected:
  Impl() = default;
  ~Impl() override;

  // Helpers of typed element classes.
  // The resident element a proxy stands for, or `target` itself.
  ModelElement residentOf(const ModelElement& target) const;
  // Moves this element's entry in the incoming index from `oldTarget` to `newTarget`
  // (either may be null): the bookkeeping of a raw store to a non-containment reference.
  void relinkIncoming(const ModelElement& oldTarget, const ModelElement& newTarget,
                      const meta::Property& property);

  // The typed setter of an attribute: when canStoreDirectly(property) it may, instead of
  // assignValue, open beginDirectStore(property), store the new (different) value raw and
  // commit. False when the property is read-only or set-once (unless `initializing`, as
  // assignValue's flag), or keys a map that holds this element: assignValue's checks need
  // the value then.
  bool canStoreDirectly(const meta::Property& property, bool initializing = false) const;
  // Checks that this element may change and records the old value of `property`, inside
  // the returned transaction (joined when one is open).
  Transaction beginDirectStore(const meta::Property& property);

  // Registers a detached element in `model` under `id` (nil: a fresh UUID), inside the
  // model's open transaction or one of its own.
  void registerIn(ModelImpl* model, const Uuid& id);

 private:
  friend class ModelImpl;
  friend class AbstractOwnedCollection;
  friend class ReferenceCollection;
  friend class PrimitiveCollection;
  friend class Builder;
  friend struct internal::TransactionState;

  // Links and unlinks `target` through `property`, recorded, keeping containment and
  // the opposite end consistent; the workhorses of setters and collections.
  void linkTo(const meta::Property& property, const ModelElement& target, std::size_t position);
  void unlinkFrom(const meta::Property& property, const ModelElement& target);
  void recordedAdd(const meta::Property& property, const ModelElement& target, std::size_t position);
  bool recordedRemove(const meta::Property& property, const Impl* target);
  void detachFromContainer();
  void collectSubtree(std::vector<Impl*>& subtree);
  void clearOutgoing();
  bool ownsProperty(const meta::Property& property) const;
  // Sets the container and records the old one.
  void setContainer(Impl* container, const meta::Property& feature);
  void basicSetContainer(Impl* container, const meta::Property& feature);
  void basicDetachFromModel();
  void checkModifiable() const;
  void checkAssignable(const meta::Property& property, const Value& value) const;
  // checkAssignable of a reference property and a non-null target, without making a Value.
  void checkReferenceAssignable(const meta::Property& property, const ModelElement& target) const;
  void setSingleReference(const meta::Property& property, const ModelElement& target, bool initializing);
  void setManyValued(const meta::Property& property, const Value& value);
  void destroySubtree(std::vector<Impl*>& subtree);
  // notifyModifying's work: the storage of this level, or null for an element made at it.
  Storage* recordOldValue(int index);

  Uuid uuid_{};
  ModelImpl* model_ = nullptr;
  Impl* container_ = nullptr;
  const void* containmentFeature_ = nullptr;   // meta::Property::Impl*
  internal::ElementRecord* record_ = nullptr;  // while the model's transaction touches it
  std::uint64_t serial_ = 0;
  State state_ = State::Detached;
  bool watched_ = false;
  bool tookOverProxy_ = false;  // a proxy of the model named this element's UUID when it came
  std::u16string proxyModelUri_;
  std::vector<IncomingReference> incoming_;
};

template <class T>
T elementCast(const ModelElement& element) {
  if (auto* impl = dynamic_cast<typename T::Impl*>(element.getImpl())) return T(impl);
  return T();
}

}  // namespace qf::zero
