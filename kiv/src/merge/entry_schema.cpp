#include "merge/entry_schema.h"

#include "qf/zero/core/meta/meta_registry.h"
#include "qf/zero/core/meta/structured_type.h"
#include "qf/zero/core/text.h"
#include "qf/zero/io/json_constants.h"

#include <nlohmann/json.hpp>

namespace kiv::merge {

namespace {

using qf::zero::JsonValue;
using qf::zero::io::JSONConstants;

Shape shapeOf(const qf::zero::meta::Property& property) {
  if (property->isSequence()) return Shape::Sequence;
  if (property->isMany()) return Shape::Set;
  return Shape::Single;
}

EntrySchema schemaOf(const std::string& type) {
  EntrySchema schema;
  const qf::zero::meta::Class metaClass =
      qf::zero::meta::MetaRegistry::getInstance().getClass(qf::zero::toUtf16(type));
  if (!metaClass || !metaClass.isLive()) return schema;
  for (const qf::zero::meta::Property& property : metaClass->getAllProperties()) {
    PropertySchema entry{qf::zero::toUtf8(property.getName()),
                         shapeOf(property),
                         property->isReference(),
                         property->isContainment(),
                         {},
                         Shape::Single,
                         false};
    if (const qf::zero::meta::Property opposite = property->getOpposite()) {
      entry.opposite = qf::zero::toUtf8(opposite.getName());
      entry.oppositeShape = shapeOf(opposite);
      entry.containerEnd = entry.shape == Shape::Single && opposite->isContainment();
    }
    schema.hasReferences = schema.hasReferences || entry.reference;
    schema.properties.push_back(std::move(entry));
  }
  return schema;
}

}  // namespace

const PropertySchema* EntrySchema::find(std::string_view name) const {
  for (const PropertySchema& property : properties) {
    if (property.name == name) return &property;
  }
  return nullptr;
}

const EntrySchema& EntrySchemas::of(const JsonValue& entry) {
  const std::string type = typeOf(entry);
  if (const auto it = byType_.find(type); it != byType_.end()) return it->second;
  return byType_.emplace(type, schemaOf(type)).first->second;
}

const JsonValue& contentOf(const JsonValue& entry) {
  static const JsonValue none = JsonValue::object();
  if (!entry.is_object()) return none;
  const auto it = entry.find(JSONConstants::CONTENT_ATTR);
  return it != entry.end() && it->is_object() ? *it : none;
}

JsonValue& contentOf(JsonValue& entry) {
  JsonValue& content = entry[JSONConstants::CONTENT_ATTR];
  if (!content.is_object()) content = JsonValue::object();
  return content;
}

std::string typeOf(const JsonValue& entry) {
  if (!entry.is_object()) return {};
  const auto it = entry.find(JSONConstants::TYPE_ATTR);
  return it != entry.end() && it->is_string() ? it->get<std::string>() : std::string();
}

std::vector<qf::zero::Uuid> referencedBy(const JsonValue& value) {
  std::vector<qf::zero::Uuid> targets;
  const auto add = [&](const JsonValue& item) {
    if (!item.is_string()) return;
    if (const auto uuid = qf::zero::parseUuid(item.get_ref<const std::string&>())) targets.push_back(*uuid);
  };
  if (value.is_array()) {
    for (const JsonValue& item : value) add(item);
  } else {
    add(value);
  }
  return targets;
}

}  // namespace kiv::merge
