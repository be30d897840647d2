#include "qf/zero/io/parse_customizer.h"

#include "qf/zero/core/messages.h"
#include "qf/zero/core/meta/meta_registry.h"
#include "qf/zero/core/meta/primitive_type.h"
#include "qf/zero/core/report_exception.h"
#include "qf/zero/io/json_constants.h"
#include "qf/zero/io/model_builder.h"

namespace qf::zero::io {

bool ParseCustomizer::shallInstantiate(const meta::Class&, const ElementId&) { return true; }

bool ParseCustomizer::shallReadProperty(const ModelElement&, const meta::Property&) { return true; }

bool ParseCustomizer::shallAddReference(const ModelElement&, const meta::Property&, const ModelElement&) {
  return true;
}

ModelElement ParseCustomizer::findReference(ModelBuilder& builder, const Model& model,
                                            const meta::Class& metaClass, const ElementId& id) {
  return builder.findReference(model, metaClass, id);
}

meta::Class ParseCustomizer::getMetaClass(std::u16string_view qualifiedName) {
  return meta::MetaRegistry::getInstance().getClass(qualifiedName);
}

meta::Property ParseCustomizer::getMetaProperty(const meta::StructuredType& type, std::u16string_view name) {
  return type->findProperty(name);
}

Value ParseCustomizer::parsePrimitiveValue(const meta::Property& property, std::u16string_view text) {
  const auto primitive = elementCast<meta::PrimitiveType>(ModelElement(property->getType()));
  if (!primitive || !primitive->getTraits()) return Value();
  std::optional<Value> value = primitive->getTraits()->parseText(text);
  return value ? *value : Value();
}

void ParseCustomizer::setVersion(std::string_view version) {
  if (version != JSONConstants::FORMAT_VERSION) {
    reportException(qf0::messages::UnsupportedFormatVersion(std::string(version)));
  }
}

void ParseCustomizer::setPackageUris(const std::vector<std::string>&) {}

}  // namespace qf::zero::io
