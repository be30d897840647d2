#include "qf/zero/core/meta/property_serializer.h"

#include <mutex>

namespace qf::zero::meta {

PropertySerializerRegistry& PropertySerializerRegistry::getInstance() {
  static PropertySerializerRegistry instance;
  return instance;
}

void PropertySerializerRegistry::registerPropertySerializer(const Type& type,
                                                            std::unique_ptr<PropertySerializer> serializer,
                                                            std::u16string key) {
  std::unique_lock lock(mutex_);
  properties_[{type.getImpl(), std::move(key)}] = std::move(serializer);
}

void PropertySerializerRegistry::registerDatatypeSerializer(const DataType& type,
                                                            std::unique_ptr<DatatypeSerializer> serializer) {
  std::unique_lock lock(mutex_);
  datatypes_[type.getImpl()] = std::move(serializer);
}

void PropertySerializerRegistry::unregister(const Type& type) {
  std::unique_lock lock(mutex_);
  std::erase_if(properties_, [&](const auto& entry) { return entry.first.first == type.getImpl(); });
  datatypes_.erase(type.getImpl());
}

const PropertySerializer* PropertySerializerRegistry::getPropertySerializer(const Type& type,
                                                                            std::u16string_view key) const {
  std::shared_lock lock(mutex_);
  if (properties_.empty()) return nullptr;
  const auto it = properties_.find(std::pair<const void*, std::u16string>(type.getImpl(), key));
  return it == properties_.end() ? nullptr : it->second.get();
}

const DatatypeSerializer* PropertySerializerRegistry::getDatatypeSerializer(const DataType& type) const {
  std::shared_lock lock(mutex_);
  const auto it = datatypes_.find(type.getImpl());
  return it == datatypes_.end() ? nullptr : it->second.get();
}

}  // namespace qf::zero::meta
