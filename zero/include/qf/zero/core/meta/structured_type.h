// StructuredType: a type with properties and operations. Class describes elements;
// DataType describes structured values (compared by value, not identity).
#pragma once

#include "qf/zero/core/meta/operation.h"
#include "qf/zero/core/meta/type.h"

#include <atomic>
#include <memory>
#include <mutex>
#include <string_view>
#include <unordered_map>
#include <vector>

namespace qf::zero::meta {

class StructuredType : public Type {
  QF_ZERO_HANDLE(StructuredType, Type)
};

// The properties and operations a class or datatype declares, in the order they were added;
// a class adds those it inherits.
class StructuredType::Impl : public Type::Impl {
 public:
  // Own properties and operations, in the order they were added.
  const std::vector<Property>& getOwnProperties() const noexcept { return ownProperties_; }
  const std::vector<Operation>& getOwnOperations() const noexcept { return ownOperations_; }
  void addProperty(const Property& property);
  void addOperation(const Operation& operation);
  // Own and inherited properties ordered by index (inherited first).
  virtual const std::vector<Property>& getAllProperties() const { return ownProperties_; }
  Property findProperty(std::u16string_view name) const;
  Operation findOperation(std::u16string_view name, std::size_t argumentCount) const;
  void invalidate() override;

 protected:
  using Type::Impl::Impl;
  virtual std::vector<StructuredType> getSuperTypes() const { return {}; }

 private:
  std::vector<Property> ownProperties_;
  std::vector<Operation> ownOperations_;
};

// Describes elements: instantiate() makes a live element of the class with the builder
// registered for it.
class Class : public StructuredType {
  QF_ZERO_HANDLE(Class, StructuredType)
  static Class create(const Model& model, const Uuid& id, std::u16string name, std::u16string qualifiedName,
                      bool isAbstract);
  // A new live element of this class in `model` (a fresh UUID when `id` is nil), made
  // by the builder registered for the class.
  ModelElement instantiate(const Model& model, const Uuid& id = {}) const;
};

// A class's superclasses and its properties by index, inherited ones first. The tables are
// built on first use, from any thread, once the metamodel is complete.
class Class::Impl : public StructuredType::Impl {
 public:
  Impl(std::u16string name, std::u16string qualifiedName, bool isAbstract)
      : StructuredType::Impl(std::move(name), std::move(qualifiedName)), isAbstract_(isAbstract) {}

  bool isAbstract() const noexcept { return isAbstract_; }
  bool isClass() const noexcept override { return true; }
  const std::vector<Class>& getSuperclasses() const noexcept { return superclasses_; }
  // Adds a superclass. Properties of superclasses come first in index order.
  void setSuperclass(const Class& superclass);
  bool isSubclassOf(const Class& other) const;  // reflexive
  const std::vector<Property>& getAllProperties() const override;
  const std::vector<Operation>& getAllOperations() const;
  // The property with `index` among all properties, or a null handle.
  Property getPropertyByIndex(int index) const;
  // One past the highest property index: the slot count of an element.
  int getSlotCount() const;
  // A builder for elements of this class in `model` (see ModelElement::Builder).
  std::unique_ptr<ModelElement::Builder> instantiateBuilder(const Model& model) const;
  void invalidate() override;

 protected:
  std::u16string_view metaClassName() const override { return u"Class"; }
  std::vector<StructuredType> getSuperTypes() const override;

 private:
  void buildCaches() const;

  bool isAbstract_;
  std::vector<Class> superclasses_;
  // Built on first use, after the metamodel is complete.
  // The caches are built on first use, possibly by several threads at once (models on
  // different threads share their metaclasses): the flag is read without the lock, and
  // the build happens under it.
  mutable std::mutex cacheMutex_;
  mutable std::atomic<bool> cachesBuilt_{false};
  mutable std::vector<Property> allProperties_;
  mutable std::vector<Operation> allOperations_;
  mutable std::vector<Property> byIndex_;
};

// Describes structured values, compared by value rather than identity; their properties are
// read and written through the type's DatatypeSerializer.
class DataType : public StructuredType {
  QF_ZERO_HANDLE(DataType, StructuredType)
  static DataType create(const Model& model, const Uuid& id, std::u16string name,
                         std::u16string qualifiedName);
};

// A datatype's properties and operations; its values carry no identity.
class DataType::Impl : public StructuredType::Impl {
 public:
  Impl(std::u16string name, std::u16string qualifiedName)
      : StructuredType::Impl(std::move(name), std::move(qualifiedName)) {}

 protected:
  std::u16string_view metaClassName() const override { return u"DataType"; }
};

}  // namespace qf::zero::meta
