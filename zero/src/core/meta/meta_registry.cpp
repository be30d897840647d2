#include "qf/zero/core/meta/meta_registry.h"

#include "qf/zero/core/messages.h"
#include "qf/zero/core/report_exception.h"

#include <mutex>

namespace qf::zero::meta {

namespace {

// One key for a type whichever handle class names it.
const void* identityOf(const ModelElement& type) { return type.getImpl(); }

}  // namespace

Type MetaRegistry::getType(std::u16string_view qualifiedName) const {
  std::shared_lock lock(mutex_);
  auto it = types_.find(qualifiedName);
  return it == types_.end() ? Type() : it->second.type;
}

Class MetaRegistry::getClass(std::u16string_view qualifiedName) const {
  return elementCast<Class>(getType(qualifiedName));
}

PrimitiveType MetaRegistry::getPrimitiveType(std::u16string_view name) const {
  return elementCast<PrimitiveType>(getType(name));
}

Package MetaRegistry::getRootPackage(std::u16string_view uri) const {
  std::shared_lock lock(mutex_);
  auto it = roots_.find(uri);
  return it == roots_.end() ? Package() : it->second;
}

void MetaRegistry::registerType(const Type& type, CollectionFactory collections, BuilderFactory builders) {
  std::unique_lock lock(mutex_);
  auto [it, inserted] = types_.try_emplace(type.getQualifiedName());
  if (!inserted && it->second.type != type) {
    reportException(qf0::messages::TypeAlreadyRegistered(type.getQualifiedName()));
  }
  it->second.type = type;
  if (collections) it->second.collections = std::move(collections);
  if (builders) it->second.builders = std::move(builders);
  if (it->second.builders) buildersByClass_[identityOf(type)] = it->second.builders;
}

void MetaRegistry::unregisterType(const Type& type) {
  std::unique_lock lock(mutex_);
  auto it = types_.find(type.getQualifiedName());
  if (it != types_.end() && it->second.type == type) {
    buildersByClass_.erase(identityOf(type));
    types_.erase(it);
  }
}

MetaRegistry::BuilderFactory MetaRegistry::getBuilderFactory(const Class& metaClass) const {
  std::shared_lock lock(mutex_);
  auto it = buildersByClass_.find(identityOf(metaClass));
  return it == buildersByClass_.end() ? BuilderFactory() : it->second;
}

void MetaRegistry::registerTypesOf(const Package& package) {
  for (const Type& type : package->getTypes()) registerType(type);
  for (const Package& sub : package->getSubPackages()) registerTypesOf(sub);
}

void MetaRegistry::unregisterTypesOf(const Package& package) {
  for (const Type& type : package->getTypes()) unregisterType(type);
  for (const Package& sub : package->getSubPackages()) unregisterTypesOf(sub);
}

void MetaRegistry::registerRootPackage(const Package& package) {
  registerTypesOf(package);
  std::unique_lock lock(mutex_);
  roots_[package->getUri()] = package;
}

void MetaRegistry::unregisterRootPackage(std::u16string_view uri) {
  Package package = getRootPackage(uri);
  if (!package) return;
  unregisterTypesOf(package);
  std::unique_lock lock(mutex_);
  roots_.erase(roots_.find(uri));
}

}  // namespace qf::zero::meta
