#include "qf/zero/core/dynamic_element.h"

#include "qf/zero/core/messages.h"
#include "qf/zero/core/meta/meta_registry.h"
#include "qf/zero/core/primitive_collection.h"
#include "qf/zero/core/reference_collection.h"
#include "qf/zero/core/report_exception.h"

#include <map>
#include <unordered_set>

namespace qf::zero {

namespace {

std::unique_ptr<AbstractOwnedCollection> makeCollection(ModelElement::Impl* owner,
                                                        const meta::Property& property) {
  if (property->isReference()) {
    if (property->isSequence()) {
      return std::make_unique<TypedReferenceCollectionWithProxies<ModelElement, std::vector<ModelElement>>>(
          owner, property);
    }
    if (property->isMap()) {
      return std::make_unique<
          TypedReferenceCollectionWithProxies<ModelElement, std::map<MapKey, ModelElement>>>(owner, property);
    }
    return std::make_unique<
        TypedReferenceCollectionWithProxies<ModelElement, std::unordered_set<ModelElement>>>(owner, property);
  }
  if (property->isSequence()) return std::make_unique<PrimitiveSequence<Value>>(owner, property);
  return std::make_unique<PrimitiveSet<Value>>(owner, property);
}

}  // namespace

DynamicElementImpl::DynamicElementImpl(meta::Class metaClass) : metaClass_(std::move(metaClass)) {
  const auto slots = static_cast<std::size_t>(metaClass_->getSlotCount());
  values_.resize(slots);
  collections_.resize(slots);
  for (const meta::Property& property : metaClass_->getAllProperties()) {
    const auto slot = static_cast<std::size_t>(property.getIndex());
    if (property->isMany()) {
      collections_[slot] = makeCollection(this, property);
    } else {
      values_[slot] = property->getDefaultValue();
    }
  }
}

DynamicElementImpl::~DynamicElementImpl() = default;

std::size_t DynamicElementImpl::slotOf(const meta::Property& property) const {
  const auto slot = static_cast<std::size_t>(property.getIndex());
  if (slot >= values_.size() || metaClass_->getPropertyByIndex(property.getIndex()) != property) {
    reportException(qf0::messages::NoSuchProperty(metaClass_.getQualifiedName(), property.getName()));
  }
  return slot;
}

Value DynamicElementImpl::basicGetValue(const meta::Property& property) const {
  return values_[slotOf(property)];
}

void DynamicElementImpl::basicSetValue(const meta::Property& property, const Value& value) {
  Value& slot = values_[slotOf(property)];
  if (property->isReference() && !property->isContainment()) {
    if (slot.isElement()) slot.getElement()->basicUnlinkIncoming(this, property);
    if (value.isElement()) value.getElement()->basicLinkIncoming(this, property);
  }
  slot = value;
}

AbstractOwnedCollection* DynamicElementImpl::basicGetCollection(const meta::Property& property) const {
  return collections_[slotOf(property)].get();
}

}  // namespace qf::zero
