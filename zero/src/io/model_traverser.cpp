#include "qf/zero/io/model_traverser.h"

#include "qf/zero/core/meta/property_serializer.h"

namespace qf::zero::io {

const std::vector<meta::Property>& ModelTraverser::getProperties(const meta::StructuredType& type,
                                                                 PropertyCategory category) {
  const Key key{type.getImpl(), category};
  if (auto it = cache_.find(key); it != cache_.end()) return it->second;
  std::vector<meta::Property> selected;
  for (const meta::Property& property : type->getAllProperties()) {
    if (isPropertyTransient(property)) continue;
    if (category == PropertyCategory::All || getPropertyCategory(property) == category)
      selected.push_back(property);
  }
  return cache_.emplace(key, std::move(selected)).first->second;
}

PropertyCategory ModelTraverser::getPropertyCategory(const meta::Property& property) const {
  if (!property->isReference()) return PropertyCategory::Attribute;
  return property->isComposite() ? PropertyCategory::Containment : PropertyCategory::Reference;
}

bool ModelTraverser::isPropertyTransient(const meta::Property& property) const {
  return property->isTransient();
}

bool JSONModelTraverser::isPropertyTransient(const meta::Property& property) const {
  if (ModelTraverser::isPropertyTransient(property)) return true;
  const auto* serializer =
      meta::PropertySerializerRegistry::getInstance().getPropertySerializer(property->getType());
  return serializer != nullptr && !serializer->isSerializable();
}

}  // namespace qf::zero::io
