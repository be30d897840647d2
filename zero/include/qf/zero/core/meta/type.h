// Type: anything a property, argument or operation result can be typed by.
#pragma once

#include "qf/zero/core/meta/named_element.h"

#include <string>

namespace qf::zero::meta {

// Whatever types a property, argument or operation; conformsTo() says whether a value of this
// type may stand where another is expected.
class Type : public NamedElement {
  QF_ZERO_HANDLE(Type, NamedElement)
  const std::u16string& getQualifiedName() const;
  // True for a class that is, or derives from, `other` (a class is compatible with
  // itself only among non-class types).
  bool conformsTo(const Type& other) const;
};

// A type's qualified name, under which the MetaRegistry finds it, and its owning package.
class Type::Impl : public NamedElement::Impl {
 public:
  Package getOwningPackage() const;
  void setOwningPackage(const Package& package);
  // "package.Type" joined by dots; bare for types of the framework's own package.
  const std::u16string& getQualifiedName() const noexcept { return qualifiedName_; }
  void setQualifiedName(std::u16string name) { qualifiedName_ = std::move(name); }
  virtual bool isClass() const noexcept { return false; }
  void invalidate() override;

 protected:
  Impl(std::u16string name, std::u16string qualifiedName)
      : NamedElement::Impl(std::move(name)), qualifiedName_(std::move(qualifiedName)) {}

 private:
  IntrusivePtr<ModelElement::Impl> owningPackage_;
  std::u16string qualifiedName_;
};

inline const std::u16string& Type::getQualifiedName() const { return getImpl()->getQualifiedName(); }

}  // namespace qf::zero::meta
