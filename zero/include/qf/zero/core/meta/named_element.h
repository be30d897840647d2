// The common base of metamodel items: packages, types, properties, operations,
// arguments and enumeration literals.
//
// Metamodel items are elements of the framework's meta model: each has a UUID and
// lives in the model of the package that made it. They are built once, outside
// transactions, and are not changed afterwards; their fields are plain C++ members
// rather than reflective properties.
#pragma once

#include "qf/zero/core/internal/element_impl.h"
#include "qf/zero/core/model_element.h"

#include <string>
#include <string_view>

namespace qf::zero::meta {

// The handle of every metamodel item: an element of a metamodel's model, with a name.
class NamedElement : public ModelElement {
  QF_ZERO_HANDLE(NamedElement, ModelElement)
  const std::u16string& getName() const;
};

// A metamodel item's state: plain C++ members rather than reflective properties, set while the
// metamodel is built and not changed afterwards.
class NamedElement::Impl : public ModelElement::Impl {
 public:
  const std::u16string& getName() const noexcept { return name_; }
  void setName(std::u16string name) { name_ = std::move(name); }

  meta::Class getMetaClass() const override;
  Value basicGetValue(const Property& property) const override;
  void basicSetValue(const Property& property, const Value& value) override;
  AbstractOwnedCollection* basicGetCollection(const Property& property) const override;
  // Attaches a freshly made item to `model` (which may be null) under `id`.
  static void adoptItem(ModelElement::Impl& item, const Model& model, const Uuid& id);

 protected:
  explicit Impl(std::u16string name) : name_(std::move(name)) {}
  // The name of this item's class in the framework's meta package ("Class", "Property" ...).
  virtual std::u16string_view metaClassName() const = 0;

 private:
  std::u16string name_;
};

inline const std::u16string& NamedElement::getName() const { return getImpl()->getName(); }

}  // namespace qf::zero::meta
