// Property and datatype serializers: how values of a type are written to JSON and
// read back, for the types whose form the JSON serializer cannot know by itself
// (generated enumerations, datatypes, opaque pointer values). The ready-made ones are in
// builtin_property_serializers.h; this header needs only nlohmann's forward declarations.
//
// Like the metamodel registry, the serializer registry is filled while metamodels
// are set up and read from any thread afterwards.
#pragma once

#include "qf/zero/core/meta/structured_type.h"
#include "qf/zero/core/value.h"

#include <nlohmann/json_fwd.hpp>

#include <map>
#include <memory>
#include <shared_mutex>
#include <string>
#include <string_view>
#include <utility>

namespace qf::zero::meta {

// Converts the values of one type to and from JSON; registered per type and key with the
// PropertySerializerRegistry.
class PropertySerializer {
 public:
  virtual ~PropertySerializer() = default;
  // False for values that have no persistent form: such properties are never written
  // and are left untouched when read.
  virtual bool isSerializable() const noexcept { return true; }
  virtual nlohmann::ordered_json toJson(const Value& value) const = 0;
  // Raises "InvalidValue" when `json` is not a value of the type.
  virtual Value fromJson(const nlohmann::ordered_json& json, const Property& property) const = 0;
};

// Reads and writes the properties of one datatype's values. Datatype values are
// immutable, so a write returns the changed value.
class DatatypeSerializer {
 public:
  virtual ~DatatypeSerializer() = default;
  // The value a parse starts from before it sets the written properties.
  virtual Value createDefault() const = 0;
  // Both raise "NoSuchProperty" for a property the datatype does not have.
  virtual Value getPropertyValue(const Value& datum, const Property& property) const = 0;
  virtual Value setPropertyValue(const Value& datum, const Property& property, const Value& value) const = 0;
};

// The process-wide table of property and datatype serializers by type. Filled while
// metamodels are set up; lookups are safe from any thread.
class PropertySerializerRegistry {
 public:
  static PropertySerializerRegistry& getInstance();

  // `key` tells apart several serializers of one type; the JSON serializer asks for
  // the empty key. A second registration under the same type and key replaces the first.
  void registerPropertySerializer(const Type& type, std::unique_ptr<PropertySerializer> serializer,
                                  std::u16string key = {});
  void registerDatatypeSerializer(const DataType& type, std::unique_ptr<DatatypeSerializer> serializer);
  // Removes every serializer registered for the type.
  void unregister(const Type& type);

  // Null when nothing is registered. The pointer stays valid until the type is
  // unregistered or its serializer replaced.
  const PropertySerializer* getPropertySerializer(const Type& type, std::u16string_view key = {}) const;
  const DatatypeSerializer* getDatatypeSerializer(const DataType& type) const;

 private:
  PropertySerializerRegistry() = default;

  mutable std::shared_mutex mutex_;
  std::map<std::pair<const void*, std::u16string>, std::unique_ptr<PropertySerializer>, std::less<>>
      properties_;
  std::map<const void*, std::unique_ptr<DatatypeSerializer>> datatypes_;
};

}  // namespace qf::zero::meta
