#include "qf/zero/io/model_builder.h"

#include "qf/zero/core/builder.h"
#include "qf/zero/core/json_text.h"
#include "qf/zero/core/meta/property_serializer.h"
#include "qf/zero/core/model_impl.h"
#include "qf/zero/core/owned_collection.h"

namespace qf::zero::io {

ModelElement ModelBuilder::instantiate(const Model& model, const meta::Class& metaClass,
                                       const ElementId& id) {
  return metaClass.instantiate(model, id.uuid.value_or(Uuid()));
}

Value ModelBuilder::instantiateDataType(const meta::DataType& type) {
  const auto* serializer = meta::PropertySerializerRegistry::getInstance().getDatatypeSerializer(type);
  return serializer ? serializer->createDefault() : Value();
}

ModelElement ModelBuilder::findReference(const Model& model, const meta::Class&, const ElementId& id) {
  if (!id.uuid) return ModelElement();
  return model->findElement(*id.uuid, FindElementBehavior::IncludeProxies);
}

void ModelBuilder::setValue(ModelElement& element, const meta::Property& property, const Value& value) {
  element->assignValue(property, value, true);
}

void ModelBuilder::setJsonValue(ModelElement& element, const meta::Property& property,
                                const JsonValue& json) {
  if (element->basicGetHeldText(property) != nullptr &&
      element->assignHeldText(property, JsonText(json), /*initializing=*/true)) {
    return;
  }
  setValue(element, property, Value::createPrimitiveValue(property, json));
}

void ModelBuilder::setObjectValue(ModelElement& element, const meta::Property& property, const Value& item) {
  element->basicGetCollection(property)->genericAdd(item);
}

void ModelBuilder::clearObjectValue(ModelElement& element, const meta::Property& property) {
  element->basicGetCollection(property)->genericClear();
}

Value ModelBuilder::createEmptyOptionalValue(const meta::Property&) { return Value(); }

ModelElement ModelBuilder::findLiveElement(const Model& model, const ElementId& id) {
  if (!id.uuid) return ModelElement();
  ModelElement existing = model->findElement(*id.uuid);
  return existing && existing.isLive() ? existing : ModelElement();
}

ModelElement ElementReusingModelBuilder::instantiate(const Model& model, const meta::Class& metaClass,
                                                     const ElementId& id) {
  if (ModelElement existing = findLiveElement(model, id)) return existing;
  return ModelBuilder::instantiate(model, metaClass, id);
}

}  // namespace qf::zero::io
