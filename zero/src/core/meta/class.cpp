#include "qf/zero/core/builder.h"
#include "qf/zero/core/messages.h"
#include "qf/zero/core/meta/meta_registry.h"
#include "qf/zero/core/meta/operation.h"
#include "qf/zero/core/meta/structured_type.h"
#include "qf/zero/core/model_impl.h"
#include "qf/zero/core/report_exception.h"

#include <unordered_set>

namespace qf::zero::meta {

Class Class::create(const Model& model, const Uuid& id, std::u16string name, std::u16string qualifiedName,
                    bool isAbstract) {
  auto* impl = new Impl(std::move(name), std::move(qualifiedName), isAbstract);
  Class handle(impl);
  NamedElement::Impl::adoptItem(*impl, model, id);
  return handle;
}

ModelElement Class::instantiate(const Model& model, const Uuid& id) const {
  std::unique_ptr<ModelElement::Builder> builder = getImpl()->instantiateBuilder(model);
  return builder->create(id);
}

void Class::Impl::setSuperclass(const Class& superclass) {
  superclasses_.push_back(superclass);
  cachesBuilt_ = false;
}

bool Class::Impl::isSubclassOf(const Class& other) const {
  if (other.getImpl() == this) return true;
  for (const Class& superclass : superclasses_) {
    if (superclass->isSubclassOf(other)) return true;
  }
  return false;
}

std::vector<StructuredType> Class::Impl::getSuperTypes() const {
  return std::vector<StructuredType>(superclasses_.begin(), superclasses_.end());
}

void Class::Impl::buildCaches() const {
  if (cachesBuilt_.load(std::memory_order_acquire)) return;
  const std::lock_guard<std::mutex> lock(cacheMutex_);
  if (cachesBuilt_.load(std::memory_order_relaxed)) return;
  allProperties_.clear();
  allOperations_.clear();
  std::unordered_set<const void*> seen;
  for (const Class& superclass : superclasses_) {
    for (const Property& property : superclass->getAllProperties()) {
      if (seen.insert(property.getImpl()).second) allProperties_.push_back(property);
    }
    for (const Operation& operation : superclass->getAllOperations()) {
      if (seen.insert(operation.getImpl()).second) allOperations_.push_back(operation);
    }
  }
  for (const Property& property : getOwnProperties()) allProperties_.push_back(property);
  for (const Operation& operation : getOwnOperations()) allOperations_.push_back(operation);
  std::stable_sort(allProperties_.begin(), allProperties_.end(),
                   [](const Property& a, const Property& b) { return a.getIndex() < b.getIndex(); });
  int highest = 0;
  for (const Property& property : allProperties_) highest = std::max(highest, property.getIndex());
  byIndex_.assign(static_cast<std::size_t>(highest) + 1, Property());
  for (const Property& property : allProperties_)
    byIndex_[static_cast<std::size_t>(property.getIndex())] = property;
  cachesBuilt_.store(true, std::memory_order_release);
}

const std::vector<Property>& Class::Impl::getAllProperties() const {
  buildCaches();
  return allProperties_;
}

const std::vector<Operation>& Class::Impl::getAllOperations() const {
  buildCaches();
  return allOperations_;
}

Property Class::Impl::getPropertyByIndex(int index) const {
  buildCaches();
  if (index < 0 || static_cast<std::size_t>(index) >= byIndex_.size()) return Property();
  return byIndex_[static_cast<std::size_t>(index)];
}

int Class::Impl::getSlotCount() const {
  buildCaches();
  return static_cast<int>(byIndex_.size());
}

std::unique_ptr<ModelElement::Builder> Class::Impl::instantiateBuilder(const Model& model) const {
  const Class self(const_cast<Impl*>(this));
  if (isAbstract_) reportException(qf0::messages::CannotInstantiateAbstractClass(getQualifiedName()));
  if (auto factory = MetaRegistry::getInstance().getBuilderFactory(self)) return factory(model);
  return std::make_unique<DynamicElementBuilder>(self, model);
}

void Class::Impl::invalidate() {
  superclasses_.clear();
  allProperties_.clear();
  allOperations_.clear();
  byIndex_.clear();
  StructuredType::Impl::invalidate();
}

}  // namespace qf::zero::meta
