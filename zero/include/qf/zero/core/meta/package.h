// Package: a namespace of types with a URI; root packages are registered with the
// MetaRegistry under their URI.
#pragma once

#include "qf/zero/core/meta/named_element.h"
#include "qf/zero/core/meta/type.h"  // complete: the constructor instantiates std::vector<Type>

#include <string>
#include <vector>

namespace qf::zero::meta {

// A namespace of types identified by its URI; registering a root package registers every type
// in it and its sub-packages.
class Package : public NamedElement {
  QF_ZERO_HANDLE(Package, NamedElement)
  static Package create(const Model& model, const Uuid& id, std::u16string uri, std::u16string name);
};

// A package's URI, types, sub-packages and imports; its qualified name prefixes those of its
// types.
class Package::Impl : public NamedElement::Impl {
 public:
  Impl(std::u16string uri, std::u16string name) : NamedElement::Impl(std::move(name)), uri_(std::move(uri)) {}
  const std::u16string& getUri() const noexcept { return uri_; }
  void setUri(std::u16string uri) { uri_ = std::move(uri); }
  Package getParentPackage() const;
  void setParentPackage(const Package& parent);
  const std::vector<Package>& getSubPackages() const noexcept { return subPackages_; }
  const std::vector<Type>& getTypes() const noexcept { return types_; }
  void addType(const Type& type);
  const std::vector<std::u16string>& getImportedPackageURIs() const noexcept { return imports_; }
  std::vector<std::u16string>& getImportedPackageURIsMutable() noexcept { return imports_; }
  // "parent.child" of the package names; the prefix of qualified type names.
  std::u16string getQualifiedName() const;
  void invalidate() override;

 protected:
  std::u16string_view metaClassName() const override { return u"Package"; }

 private:
  std::u16string uri_;
  ModelElement::Impl* parent_ = nullptr;  // raw: the parent owns its sub-packages
  std::vector<Package> subPackages_;
  std::vector<Type> types_;
  std::vector<std::u16string> imports_;
};

}  // namespace qf::zero::meta
