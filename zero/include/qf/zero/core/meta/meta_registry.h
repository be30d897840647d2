// MetaRegistry: the process-wide index of types and root packages, and the one
// piece of global mutable state of the framework. Registration happens while
// metamodels are set up; lookups may come from any thread.
//
//   meta::Class book = meta::MetaRegistry::getInstance().getClass(u"library.Book");
#pragma once

#include "qf/zero/core/meta/package.h"
#include "qf/zero/core/meta/primitive_type.h"
#include "qf/zero/core/meta/structured_type.h"

#include <functional>
#include <map>
#include <memory>
#include <shared_mutex>
#include <string>
#include <string_view>
#include <unordered_map>

namespace qf::zero::meta {

// Finds types by qualified name and root packages by URI, for documents, packets and
// reflection. Lookups are safe from any thread; registering belongs to metamodel set-up.
class MetaRegistry {
 public:
  using CollectionFactory = std::function<std::unique_ptr<AbstractOwnedCollection>(ModelElement::Impl* owner,
                                                                                   const Property& property)>;
  using BuilderFactory = std::function<std::unique_ptr<ModelElement::Builder>(const Model& model)>;

  static MetaRegistry& getInstance();

  // Null handles when nothing is registered under the name.
  Type getType(std::u16string_view qualifiedName) const;
  Class getClass(std::u16string_view qualifiedName) const;
  PrimitiveType getPrimitiveType(std::u16string_view name) const;
  Package getRootPackage(std::u16string_view uri) const;

  // Raises "TypeAlreadyRegistered" when another type has the qualified name. The
  // builder factory makes the elements of a class (generated classes register theirs;
  // run-time classes fall back to dynamic elements).
  void registerType(const Type& type, CollectionFactory collections = {}, BuilderFactory builders = {});
  void unregisterType(const Type& type);
  BuilderFactory getBuilderFactory(const Class& metaClass) const;

  // Registers the package and every type in it and its sub-packages.
  void registerRootPackage(const Package& package);
  void unregisterRootPackage(std::u16string_view uri);

 private:
  MetaRegistry() = default;
  struct Entry {
    Type type;
    CollectionFactory collections;
    BuilderFactory builders;
  };
  void registerTypesOf(const Package& package);
  void unregisterTypesOf(const Package& package);

  mutable std::shared_mutex mutex_;
  std::map<std::u16string, Entry, std::less<>> types_;
  // The builder factories of the registered classes that have one, by the class itself:
  // every element made goes through here, and a class's qualified name is built anew on
  // each call. A key is only ever a type that types_ holds, which keeps it alive.
  std::unordered_map<const void*, BuilderFactory> buildersByClass_;
  std::map<std::u16string, Package, std::less<>> roots_;
};

}  // namespace qf::zero::meta
