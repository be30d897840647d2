#include "qf/zero/core/internal/element_impl.h"

#include "core/transaction_state.h"
#include "qf/zero/core/builder.h"
#include "qf/zero/core/internal/storage.h"
#include "qf/zero/core/json_text.h"
#include "qf/zero/core/messages.h"
#include "qf/zero/core/meta/enum.h"
#include "qf/zero/core/meta/operation.h"
#include "qf/zero/core/meta/primitive_type.h"
#include "qf/zero/core/meta/structured_type.h"
#include "qf/zero/core/model_impl.h"
#include "qf/zero/core/primitive_collection.h"
#include "qf/zero/core/reference_collection.h"
#include "qf/zero/core/report_exception.h"

#include <algorithm>

namespace qf::zero {

namespace {

const meta::Property::Impl* propertyImpl(const meta::Property& property) { return property.getImpl(); }

meta::Property propertyHandle(const void* impl) {
  return meta::Property(const_cast<ModelElement::Impl*>(
      static_cast<const ModelElement::Impl*>(static_cast<const meta::Property::Impl*>(impl))));
}

}  // namespace

ModelElement::Impl::~Impl() = default;

std::string ModelElement::Impl::identifier() const { return toText(uuid_); }

Model ModelElement::Impl::getModel() const { return Model(model_); }

ProxyId ModelElement::Impl::getProxyId() const {
  return ProxyId{uuid_, isProxy() ? proxyModelUri_ : std::u16string()};
}

ProxyId ModelElement::Impl::getPersistentProxyId(bool withModelUri) const {
  ProxyId id{uuid_, {}};
  if (withModelUri) id.modelUri = isProxy() ? proxyModelUri_ : (model_ ? model_->getUri() : std::u16string());
  return id;
}

ModelElement ModelElement::Impl::container() const { return ModelElement(container_); }

meta::Property ModelElement::Impl::containmentFeature() const {
  return containmentFeature_ ? propertyHandle(containmentFeature_) : meta::Property();
}

const std::vector<meta::Property>& ModelElement::Impl::allProperties() const {
  return getMetaClass()->getAllProperties();
}

// ---- checks -----------------------------------------------------------------

void ModelElement::Impl::checkModifiable() const {
  if (isProxy()) reportException(qf0::messages::CannotModifyProxy());
  if (!isLive() || model_ == nullptr) reportException(qf0::messages::CannotModifyDestroyedElement());
  if (model_->isFrozen()) reportException(qf0::messages::CannotModifyFrozenModel());
}

void ModelElement::Impl::checkNotProxy() const {
  if (isProxy()) reportException(qf0::messages::CannotModifyProxy());
}

ModelElement ModelElement::Impl::residentOf(const ModelElement& target) const {
  if (!target.isProxy() || model_ == nullptr) return target;
  ModelElement resident = model_->peekResolveProxy(this, target);
  return resident ? resident : target;
}

void ModelElement::Impl::relinkIncoming(const ModelElement& oldTarget, const ModelElement& newTarget,
                                        const meta::Property& property) {
  if (oldTarget == newTarget) return;
  if (oldTarget) oldTarget->basicUnlinkIncoming(this, property);
  if (newTarget) newTarget->basicLinkIncoming(this, property);
}

void ModelElement::Impl::checkCircularContainment(const ModelElement& child) const {
  for (const Impl* up = this; up != nullptr; up = up->container_) {
    if (up == child.getImpl()) reportException(qf0::messages::CannotCreateCircularContainment());
  }
}

void ModelElement::Impl::checkCompatibleModel(const Impl* target, const meta::Property&) const {
  if (target != nullptr && target->model_ != model_) {
    reportException(qf0::messages::CannotCreateCrossModelAssociation());
  }
}

// Checks that `value` may become (or join) the value of `property` of this element.
void ModelElement::Impl::checkAssignable(const meta::Property& property, const Value& value) const {
  if (value.isEmpty()) return;
  const meta::Type type = property->getType();
  if (property->isReference()) {
    if (!value.isElement()) reportException(qf0::messages::InvalidValue());
    checkReferenceAssignable(property, value.getElement());
    return;
  }
  if (value.isElement()) {
    // Run-time enumerations hold their literal element.
    auto literal = elementCast<meta::EnumLiteral>(value.getElement());
    if (!literal || ModelElement(literal->getParentEnum()) != ModelElement(type)) {
      reportException(qf0::messages::InvalidValue());
    }
    return;
  }
  if (auto primitive = elementCast<meta::PrimitiveType>(type); primitive && primitive->getTraits()) {
    if (value.heldType() != primitive->getTraits()->cppType()) reportException(qf0::messages::InvalidValue());
  }
}

void ModelElement::Impl::checkReferenceAssignable(const meta::Property& property,
                                                  const ModelElement& target) const {
  const meta::Type type = property->getType();
  if (!target.isLive() && !target.isProxy()) reportException(qf0::messages::CannotAddNonExistentObject());
  if (!target.getMetaClass().conformsTo(type)) {
    reportException(qf0::messages::CannotAddIncompatibleTypes(type.getQualifiedName(),
                                                              target.getMetaClass().getQualifiedName()));
  }
  if (!target.isProxy()) checkCompatibleModel(target.getImpl(), property);
  if (property->isContainment()) {
    if (target.isProxy()) reportException(qf0::messages::InvalidValue());
    checkCircularContainment(target);
  }
  // Through a container-side reference the target becomes this element's container.
  if (const meta::Property opposite = property->getOpposite(); opposite && opposite->isContainment()) {
    if (target.isProxy()) reportException(qf0::messages::InvalidValue());
    target->checkCircularContainment(ModelElement(const_cast<Impl*>(this)));
  }
}

// ---- reflection ---------------------------------------------------------------

bool ModelElement::Impl::ownsProperty(const meta::Property& property) const {
  if (!property) return false;
  const auto owner = elementCast<meta::Class>(ModelElement(property->getOwningType()));
  return owner && getMetaClass()->isSubclassOf(owner);
}

meta::Property ModelElement::Impl::propertyForSlot(int index) const {
  return getMetaClass()->getPropertyByIndex(index);
}

Value ModelElement::Impl::getPropertyValue(const meta::Property& property, AccessTag tag) const {
  if (!ownsProperty(property)) {
    reportException(qf0::messages::NoSuchProperty(getMetaClass().getQualifiedName(),
                                                  property ? property.getName() : std::u16string()));
  }
  if (property->isMany()) return Value::collectionView(basicGetCollection(property), property);
  Value value = basicGetValue(property);
  if (tag == AccessTag::Default && value.isElement() && value.getElement().isProxy() && model_ != nullptr) {
    if (ModelElement resident = model_->peekResolveProxy(this, value.getElement()); resident) {
      return Value::createElementValue(resident, property);
    }
  }
  return value;
}

bool ModelElement::Impl::hasPropertyValue(const meta::Property& property, AccessTag tag) const {
  const Value value = getPropertyValue(property, tag);
  if (property->isMany()) return value.getValue<AbstractOwnedCollection*>()->size() != 0;
  return !value.isEmpty();
}

void ModelElement::Impl::setPropertyValue(const meta::Property& property, const Value& value, AccessTag) {
  assignValue(property, value, false);
}

void ModelElement::Impl::assignValue(const meta::Property& property, const Value& value, bool initializing) {
  if (!ownsProperty(property)) {
    reportException(qf0::messages::NoSuchProperty(getMetaClass().getQualifiedName(),
                                                  property ? property.getName() : std::u16string()));
  }
  checkModifiable();
  if (property->isReadOnly() && !initializing) {
    reportException(qf0::messages::CannotSetReadOnlyProperty(property.getQualifiedName()));
  }
  if (property->isMany()) {
    setManyValued(property, value);
    return;
  }
  if (property->isReference()) {
    checkAssignable(property, value);
    setSingleReference(property, value.getElement(), initializing);
    return;
  }
  // An attribute that keeps its value needs no further check: refreshing an element in
  // place sets mostly such values.
  const Value current = basicGetValue(property);
  if (current == value) return;
  checkAssignable(property, value);
  if (property->isSetOnce() && !initializing && !current.isEmpty() &&
      !(current == property->getDefaultValue())) {
    reportException(qf0::messages::CannotSetSetOnceProperty(property.getQualifiedName()));
  }
  // Maps keyed by this property must be told of the new key before it is stored.
  std::vector<ReferenceCollection*> keyedMaps;
  auto collectMap = [&](Impl* owner, const void* viaProperty) {
    const meta::Property via = propertyHandle(viaProperty);
    if (!via->isMap() || via->getQualifiedBy() != property) return;
    auto* map = static_cast<ReferenceCollection*>(owner->basicGetCollection(via));
    if (ModelElement holder = map->basicFindByKey(mapKeyFromValue(value));
        holder && holder.getImpl() != this) {
      reportException(qf0::messages::UniquenessConstraint());
    }
    if (std::find(keyedMaps.begin(), keyedMaps.end(), map) == keyedMaps.end()) keyedMaps.push_back(map);
  };
  if (container_ != nullptr) collectMap(container_, containmentFeature_);
  for (const IncomingReference& incoming : incoming_) collectMap(incoming.source, incoming.property);

  Transaction transaction = model_->beginTransaction(false);
  for (ReferenceCollection* map : keyedMaps) map->recordedErase(this);
  notifyModifying(property.getIndex());
  basicSetValue(property, value.isEmpty() && !property->isOptional() ? property->getDefaultValue() : value);
  for (ReferenceCollection* map : keyedMaps)
    map->recordedInsert(ReferenceCollection::npos, ModelElement(this));
  transaction.commit();
}

bool ModelElement::Impl::canStoreDirectly(const meta::Property& property, bool initializing) const {
  if (!initializing && (property->isReadOnly() || property->isSetOnce())) return false;
  const auto keyedByProperty = [&](const void* via) {
    const meta::Property map = propertyHandle(via);
    return map->isMap() && map->getQualifiedBy() == property;
  };
  if (container_ != nullptr && keyedByProperty(containmentFeature_)) return false;
  return std::none_of(incoming_.begin(), incoming_.end(),
                      [&](const IncomingReference& incoming) { return keyedByProperty(incoming.property); });
}

Transaction ModelElement::Impl::beginDirectStore(const meta::Property& property) {
  checkModifiable();
  Transaction transaction = model_->beginTransaction(false);
  notifyModifying(property.getIndex());
  return transaction;
}

void ModelElement::Impl::setManyValued(const meta::Property& property, const Value& value) {
  if (!value.isEmpty() && !value.isList()) reportException(qf0::messages::InvalidValue());
  const std::vector<Value> items = value.isEmpty() ? std::vector<Value>() : value.getList();
  auto* collection = basicGetCollection(property);
  Transaction transaction = model_->beginTransaction(true);
  collection->genericClear();
  for (const Value& item : items) collection->genericAdd(item);
  transaction.commit();
}

void ModelElement::Impl::setSingleReference(const meta::Property& property, const ModelElement& target,
                                            bool initializing) {
  const Value current = basicGetValue(property);
  if (current.getElement() == target) return;
  if (property->isSetOnce() && !initializing && current.isElement()) {
    reportException(qf0::messages::CannotSetSetOnceProperty(property.getQualifiedName()));
  }
  const meta::Property opposite = property->getOpposite();
  if (target && opposite && opposite->isMap() && !target.isProxy()) {
    auto* map = static_cast<ReferenceCollection*>(target->basicGetCollection(opposite));
    if (ModelElement holder = map->basicFindByKey(map->keyOf(ModelElement(this)));
        holder && holder.getImpl() != this) {
      reportException(qf0::messages::UniquenessConstraint());
    }
  }
  Transaction transaction = model_->beginTransaction(false);
  if (current.isElement()) unlinkFrom(property, current.getElement());
  if (target) linkTo(property, target, ReferenceCollection::npos);
  transaction.commit();
}

Value ModelElement::Impl::invoke(const meta::Operation& operation, std::vector<Value> arguments, AccessTag) {
  const auto* invoker = operation ? operation->getInvoker() : nullptr;
  if (invoker == nullptr) {
    reportException(qf0::messages::NoSuchOperation(getMetaClass().getQualifiedName(),
                                                   operation ? operation.getName() : std::u16string()));
  }
  const auto expected = static_cast<std::int64_t>(operation->getArguments().size());
  if (static_cast<std::int64_t>(arguments.size()) != expected) {
    reportException(qf0::messages::WrongArgumentCount(operation.getName(), expected,
                                                      static_cast<std::int64_t>(arguments.size())));
  }
  return invoker->invoke(*this, arguments);
}

// ---- links: containment and opposites -------------------------------------------

void ModelElement::Impl::recordedAdd(const meta::Property& property, const ModelElement& target,
                                     std::size_t position) {
  if (property->isMany()) {
    static_cast<ReferenceCollection*>(basicGetCollection(property))->recordedInsert(position, target);
  } else {
    notifyModifying(property.getIndex());
    basicSetValue(property, Value::createElementValue(target, property));
  }
}

bool ModelElement::Impl::recordedRemove(const meta::Property& property, const Impl* target) {
  if (property->isMany()) {
    return static_cast<ReferenceCollection*>(basicGetCollection(property))->recordedErase(target);
  }
  if (basicGetValue(property).getElement().getImpl() != target) return false;
  notifyModifying(property.getIndex());
  basicSetValue(property, Value());
  return true;
}

void ModelElement::Impl::linkTo(const meta::Property& property, const ModelElement& target,
                                std::size_t position) {
  Impl* t = target.getImpl();
  if (!property->isMany()) {
    const ModelElement old = basicGetValue(property).getElement();
    if (old == target) return;
    if (old) unlinkFrom(property, old);
  }
  if (property->isContainment()) t->detachFromContainer();
  const meta::Property opposite = property->getOpposite();
  if (opposite && !target.isProxy() && !opposite->isMany()) {
    const ModelElement displaced = t->basicGetValue(opposite).getElement();
    if (displaced && displaced.getImpl() != this) displaced->unlinkFrom(property, target);
  }
  recordedAdd(property, target, position);
  if (property->isContainment()) t->setContainer(this, property);
  if (opposite && !target.isProxy()) {
    if (opposite->isContainment()) detachFromContainer();
    const bool present =
        opposite->isMany()
            ? static_cast<ReferenceCollection*>(t->basicGetCollection(opposite))->basicContains(this)
            : t->basicGetValue(opposite).getElement().getImpl() == this;
    if (!present) t->recordedAdd(opposite, ModelElement(this), ReferenceCollection::npos);
    if (opposite->isContainment()) setContainer(t, opposite);
  }
}

void ModelElement::Impl::unlinkFrom(const meta::Property& property, const ModelElement& target) {
  Impl* t = target.getImpl();
  if (!recordedRemove(property, t)) return;
  if (property->isContainment() && t->container_ == this) t->setContainer(nullptr, meta::Property());
  const meta::Property opposite = property->getOpposite();
  if (opposite && !target.isProxy()) {
    t->recordedRemove(opposite, this);
    if (opposite->isContainment() && container_ == t) setContainer(nullptr, meta::Property());
  }
}

void ModelElement::Impl::detachFromContainer() {
  if (container_ == nullptr) return;
  container_->unlinkFrom(containmentFeature(), ModelElement(this));
  if (container_ != nullptr) setContainer(nullptr, meta::Property());
}

void ModelElement::Impl::inverseAdd(const ModelElement& source, const meta::Property& property) {
  linkTo(property, source, ReferenceCollection::npos);
}

void ModelElement::Impl::inverseRemove(const ModelElement& source, const meta::Property& property) {
  unlinkFrom(property, source);
}

bool ModelElement::Impl::inverseContainsProxyTo(const ProxyId& id, const meta::Property& property) const {
  if (property->isMany()) {
    return static_cast<ReferenceCollection*>(basicGetCollection(property))->basicContainsProxyTo(id);
  }
  const ModelElement value = basicGetValue(property).getElement();
  return value && value.isProxy() && value->getProxyId() == id;
}

void ModelElement::Impl::setContainer(Impl* container, const meta::Property& feature) {
  if (container_ == container && containmentFeature_ == propertyImpl(feature)) return;
  notifyModifying(kContainerIndex);
  basicSetContainer(container, feature);
}

void ModelElement::Impl::basicSetContainer(Impl* container, const meta::Property& feature) {
  container_ = container;
  containmentFeature_ = container != nullptr ? propertyImpl(feature) : nullptr;
  if (model_ != nullptr && isLive()) model_->updateTopLevel(this);
}

// ---- incoming references ------------------------------------------------------------

void ModelElement::Impl::basicLinkIncoming(Impl* source, const meta::Property& property) {
  incoming_.push_back({source, propertyImpl(property)});
}

void ModelElement::Impl::basicUnlinkIncoming(Impl* source, const meta::Property& property) {
  const void* p = propertyImpl(property);
  auto it = std::find_if(incoming_.rbegin(), incoming_.rend(),
                         [&](const IncomingReference& r) { return r.source == source && r.property == p; });
  if (it != incoming_.rend()) incoming_.erase(std::next(it).base());
}

// ---- change tracking -------------------------------------------------------------------

void ModelElement::Impl::notifyModifying(int index) { (void)recordOldValue(index); }

std::vector<ModelElement::Impl::CollectionEdit>* ModelElement::Impl::notifyCollectionModifying(int index) {
  Storage* storage = recordOldValue(index);
  return storage != nullptr ? storage->editLog(index) : nullptr;
}

ModelElement::Impl::Storage* ModelElement::Impl::recordOldValue(int index) {
  if (model_ == nullptr || model_->txn_ == nullptr) reportException(qf0::messages::TransactionNotOpen());
  checkModifiable();
  internal::TransactionState& state = *model_->txn_;
  ++state.changeCount;
  if (watched_) ++model_->watchedChanges_;
  internal::ElementRecord& record = model_->recordFor(this);
  const int level = state.currentLevel();
  if (record.createdLevel == level) return nullptr;
  Storage* storage = record.storageAt(level);
  if (storage == nullptr) {
    record.storages.push_back({level, std::shared_ptr<Storage>(createStorage())});
    storage = record.storages.back().storage.get();
    state.list(record);
  }
  if (storage->isChanged(index)) return storage;
  if (index == kContainerIndex) {
    storage->setOldContainer(container(), containmentFeature());
  } else {
    copyValue(storage, index);
  }
  storage->setChanged(index, true);
  return storage;
}

std::unique_ptr<ModelElement::Impl::Storage> ModelElement::Impl::createStorage() const {
  const meta::Class metaClass = getMetaClass();
  return std::make_unique<Storage>(uuid_, getModel(), metaClass, metaClass->getSlotCount());
}

void ModelElement::Impl::copyValue(Storage* storage, int index) const {
  const meta::Property property = propertyForSlot(index);
  if (property->isMany()) {
    storage->startEditLog(index);
  } else {
    storage->setOldValue(index, basicGetValue(property));
  }
}

void ModelElement::Impl::copyStateFromStorage(Storage* storage) {
  restoreFromStorage(storage, false);
  restoreFromStorage(storage, true);
}

void ModelElement::Impl::restoreFromStorage(Storage* storage, bool collections) {
  if (!collections && storage->isChanged(kContainerIndex)) {
    basicSetContainer(storage->getOldContainer().getImpl(), storage->getOldContainmentFeature());
  }
  for (int index : storage->changedIndexes()) {
    if (!storage->holdsSlot(index)) continue;
    const meta::Property property = propertyForSlot(index);
    if (property->isMany() != collections) continue;
    if (collections) {
      if (storage->holdsEditLog(index)) {
        basicGetCollection(property)->undo(storage->editLogOf(index));
      } else {
        basicGetCollection(property)->restore(storage->oldCollection(index));
      }
    } else {
      basicSetValue(property, storage->oldValue(index));
    }
  }
}

// ---- life cycle ------------------------------------------------------------------------

void ModelElement::Impl::registerIn(ModelImpl* model, const Uuid& id) {
  if (model == nullptr) reportException(qf0::messages::CannotCreateWithoutModel());
  if (model->isFrozen()) reportException(qf0::messages::CannotModifyFrozenModel());
  const Uuid uuid = id.is_nil() ? generateNewUuid() : id;
  // One look-up both refuses a taken UUID and claims a free one.
  if (!model->elements_.tryInsert(uuid, IntrusivePtr<Impl>(this))) {
    reportException(qf0::messages::DuplicateElementId(toText(uuid)));
  }
  Transaction transaction = model->beginTransaction(false);
  uuid_ = uuid;
  model_ = model;
  serial_ = model->nextSerial_++;
  state_ = State::Live;
  model->indexElement(this);
  ++model->txn_->changeCount;
  internal::ElementRecord& record = model->recordFor(this);
  record.createdLevel = model->txn_->currentLevel();
  model->txn_->list(record);
  transaction.commit();
}

void ModelElement::Impl::adoptInto(ModelImpl* model, const Uuid& id) {
  uuid_ = id.is_nil() ? generateNewUuid() : id;
  state_ = State::Live;
  if (model == nullptr) return;
  model_ = model;
  serial_ = model->nextSerial_++;
  model->elements_.tryInsert(uuid_, IntrusivePtr<Impl>(this));
  model->updateTopLevel(this);
}

void ModelElement::Impl::destroy() {
  checkModifiable();
  std::vector<Impl*> subtree;
  collectSubtree(subtree);
  Transaction transaction = model_->beginTransaction(false);
  for (Impl* element : subtree) element->aboutToDestroy();
  for (Impl* element : subtree) {
    while (!element->incoming_.empty()) {
      const IncomingReference incoming = element->incoming_.back();
      const std::size_t before = element->incoming_.size();
      incoming.source->unlinkFrom(propertyHandle(incoming.property), ModelElement(element));
      if (element->incoming_.size() == before) element->incoming_.pop_back();  // stale: cannot happen
    }
  }
  for (Impl* element : subtree) element->clearOutgoing();
  detachFromContainer();
  for (Impl* element : subtree) {
    if (element->watched_) ++model_->watchedChanges_;
    internal::ElementRecord& record = model_->recordFor(element);
    model_->txn_->list(record);
    element->state_ = State::Destroyed;
    record.destroyedLevel = model_->txn_->currentLevel();
    model_->unregisterElement(element);
  }
  transaction.commit();
}

void ModelElement::Impl::collectSubtree(std::vector<Impl*>& subtree) {
  subtree.push_back(this);
  for (std::size_t i = subtree.size() - 1; i < subtree.size(); ++i) {
    Impl* element = subtree[i];
    for (const meta::Property& property : element->allProperties()) {
      if (!property->isContainment()) continue;
      if (property->isMany()) {
        static_cast<ReferenceCollection*>(element->basicGetCollection(property))
            ->basicForEach([&](const ModelElement& child) {
              if (child.isLive()) subtree.push_back(child.getImpl());
            });
      } else if (ModelElement child = element->basicGetValue(property).getElement();
                 child && child.isLive()) {
        subtree.push_back(child.getImpl());
      }
    }
  }
}

// Clears the references a doomed element holds, except containment (its subtree goes
// with it) and the back reference to its container (the container's own removal
// clears it). Records every reference property so that old values stay answerable.
void ModelElement::Impl::clearOutgoing() {
  for (const meta::Property& property : allProperties()) {
    if (!property->isReference()) continue;
    notifyModifying(property.getIndex());
    if (property->isContainment()) continue;
    const meta::Property opposite = property->getOpposite();
    if (opposite && opposite->isContainment()) continue;
    if (property->isMany()) {
      auto* collection = static_cast<ReferenceCollection*>(basicGetCollection(property));
      for (const ModelElement& target : collection->getAllValuesAndProxies()) unlinkFrom(property, target);
    } else if (ModelElement target = basicGetValue(property).getElement(); target) {
      unlinkFrom(property, target);
    }
  }
}

void ModelElement::Impl::invalidate() {
  for (const meta::Property& property : allProperties()) {
    if (!property->isReference()) continue;
    if (property->isMany()) {
      static_cast<ReferenceCollection*>(basicGetCollection(property))->rawClear();
    } else if (basicGetValue(property).isElement()) {
      basicSetValue(property, Value());
    }
  }
  container_ = nullptr;
  containmentFeature_ = nullptr;
}

void ModelElement::Impl::basicDetachFromModel() {
  state_ = State::Destroyed;
  model_ = nullptr;
  container_ = nullptr;
  containmentFeature_ = nullptr;
  incoming_.clear();
}

ModelElement ModelElement::Impl::createProxy(ModelImpl* model, const meta::Class& metaClass,
                                             const ProxyId& id) {
  if (model != nullptr) {
    if (auto it = model->proxies_.find(id.elementId); it != model->proxies_.end())
      return ModelElement(it->second);
  }
  std::unique_ptr<ModelElement::Builder> builder = metaClass->instantiateBuilder(Model(model));
  IntrusivePtr<Impl> proxy = builder->instantiate();
  proxy->uuid_ = id.elementId;
  proxy->model_ = model;
  proxy->state_ = State::Proxy;
  proxy->proxyModelUri_ = id.modelUri;
  if (model != nullptr) model->proxies_.emplace(id.elementId, proxy);
  return ModelElement(proxy);
}

// ---- the handle --------------------------------------------------------------------------

ModelElement::ModelElement(Impl* impl) noexcept : impl_(impl) {}
const Uuid& ModelElement::getUuid() const { return impl_->getUuid(); }
std::string ModelElement::identifier() const { return impl_->identifier(); }
Model ModelElement::getModel() const { return impl_->getModel(); }
meta::Class ModelElement::getMetaClass() const { return impl_->getMetaClass(); }
bool ModelElement::isLive() const { return impl_ && impl_->isLive(); }
bool ModelElement::isProxy() const { return impl_ && impl_->isProxy(); }
bool ModelElement::isTopLevel() const { return impl_->isTopLevel(); }
ModelElement ModelElement::container() const { return impl_->container(); }
meta::Property ModelElement::containmentFeature() const { return impl_->containmentFeature(); }
Value ModelElement::getPropertyValue(const meta::Property& property) const {
  return impl_->getPropertyValue(property);
}
void ModelElement::setPropertyValue(const meta::Property& property, const Value& value) {
  impl_->setPropertyValue(property, value);
}
bool ModelElement::hasPropertyValue(const meta::Property& property) const {
  return impl_->hasPropertyValue(property);
}
Value ModelElement::invoke(const meta::Operation& operation, std::vector<Value> arguments) {
  return impl_->invoke(operation, std::move(arguments));
}
void ModelElement::destroy() { impl_->destroy(); }

const JsonText* ModelElement::Impl::basicGetHeldText(const meta::Property&) const { return nullptr; }

bool ModelElement::Impl::assignHeldText(const meta::Property&, JsonText, bool) { return false; }

MapKey ModelElement::Impl::basicGetMapKey(const meta::Property& property) const {
  return mapKeyFromValue(basicGetValue(property));
}

}  // namespace qf::zero
