#include "qf/zero/core/builder.h"

#include "qf/zero/core/dynamic_element.h"
#include "qf/zero/core/messages.h"
#include "qf/zero/core/model_impl.h"
#include "qf/zero/core/owned_collection.h"
#include "qf/zero/core/report_exception.h"

namespace qf::zero {

using Builder = ModelElement::Builder;

Builder& Builder::setOrAdd(const meta::Property& property, Value value) {
  entries_.push_back({property, std::move(value), nullptr, nullptr});
  return *this;
}

Builder& Builder::setOrAdd(const meta::Property& property, std::unique_ptr<Builder> child) {
  entries_.push_back({property, Value(), std::move(child), nullptr});
  return *this;
}

Builder& Builder::setOrAddReference(const meta::Property& property, Builder* target) {
  entries_.push_back({property, Value(), nullptr, target});
  return *this;
}

void Builder::make() {
  if (!model_) reportException(qf0::messages::CannotCreateWithoutModel());
  IntrusivePtr<Impl> element = instantiate();
  element->registerIn(model_.getImpl(), uuid_);
  created_ = ModelElement(element);
  for (Entry& entry : entries_) {
    if (!entry.child) continue;
    entry.child->setModel(model_);
    entry.child->make();
  }
}

void Builder::apply() {
  for (Entry& entry : entries_) {
    if (entry.child) entry.child->apply();
    Value value = entry.value;
    if (entry.child) value = Value::createElementValue(entry.child->created_, entry.property);
    if (entry.reference) value = Value::createElementValue(entry.reference->created_, entry.property);
    doSetOrAdd(*created_.getImpl(), entry.property, value);
  }
}

void Builder::doSetOrAdd(Impl& element, const meta::Property& property, const Value& value) {
  if (property->isMany() && !value.isList()) {
    element.getPropertyValue(property, AccessTag::NoProxyResolve)
        .getValue<AbstractOwnedCollection*>()
        ->genericAdd(value);
  } else {
    element.assignValue(property, value, true);
  }
}

ModelElement Builder::create(const Uuid& id) {
  if (!model_) reportException(qf0::messages::CannotCreateWithoutModel());
  if (!id.is_nil()) uuid_ = id;
  Transaction transaction = model_->beginTransaction(true);
  make();
  apply();
  transaction.commit();
  return created_;
}

Builder* Builder::Orchestrator::addBuilder(std::unique_ptr<Builder> builder) {
  builder->setModel(model_);
  builders_.push_back(std::move(builder));
  return builders_.back().get();
}

void Builder::Orchestrator::commit() {
  if (!model_) reportException(qf0::messages::CannotCreateWithoutModel());
  Transaction transaction = model_->beginTransaction(true);
  for (auto& builder : builders_) builder->make();
  for (auto& builder : builders_) builder->apply();
  transaction.commit();
}

IntrusivePtr<ModelElement::Impl> DynamicElementBuilder::instantiate() {
  return IntrusivePtr<ModelElement::Impl>(new DynamicElementImpl(metaClass_));
}

}  // namespace qf::zero
