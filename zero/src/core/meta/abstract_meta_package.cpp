#include "qf/zero/core/meta/abstract_meta_package.h"

#include "qf/zero/core/messages.h"
#include "qf/zero/core/meta/meta_registry.h"
#include "qf/zero/core/report_exception.h"

namespace qf::zero::meta {

namespace {

Uuid itemId(std::string_view uuidText) {
  const std::optional<Uuid> id = parseUuid(uuidText);
  if (!id || id->is_nil()) reportException(qf0::messages::InvalidValue());
  return *id;
}

}  // namespace

AbstractMetaPackage::AbstractMetaPackage() : metaModel_(Model::create(generateNewUuid())) {}

AbstractMetaPackage::~AbstractMetaPackage() = default;

Package AbstractMetaPackage::createPackage(std::u16string uri, std::u16string name,
                                           std::string_view uuidText) {
  return Package::create(metaModel_, itemId(uuidText), std::move(uri), std::move(name));
}

Class AbstractMetaPackage::createClass(std::u16string name, std::u16string qualifiedName, bool isAbstract,
                                       std::string_view uuidText) {
  return Class::create(metaModel_, itemId(uuidText), std::move(name), std::move(qualifiedName), isAbstract);
}

DataType AbstractMetaPackage::createDataType(std::u16string name, std::u16string qualifiedName,
                                             std::string_view uuidText) {
  return DataType::create(metaModel_, itemId(uuidText), std::move(name), std::move(qualifiedName));
}

Enum AbstractMetaPackage::createEnum(std::u16string name, std::u16string qualifiedName,
                                     std::string_view uuidText) {
  return Enum::create(metaModel_, itemId(uuidText), std::move(name), std::move(qualifiedName));
}

EnumLiteral AbstractMetaPackage::createEnumLiteral(std::u16string name, int value,
                                                   std::string_view uuidText) {
  return EnumLiteral::create(metaModel_, itemId(uuidText), std::move(name), value);
}

PrimitiveType AbstractMetaPackage::createPrimitiveType(std::u16string name, std::u16string qualifiedName,
                                                       std::shared_ptr<const ValueTraits> traits,
                                                       std::string_view uuidText) {
  return PrimitiveType::create(metaModel_, itemId(uuidText), std::move(name), std::move(qualifiedName),
                               std::move(traits));
}

Property AbstractMetaPackage::createProperty(std::u16string name, ValueFlags flags, bool isComposite,
                                             std::string_view uuidText) {
  return Property::create(metaModel_, itemId(uuidText), std::move(name), flags, isComposite);
}

Operation AbstractMetaPackage::createOperation(std::u16string name, std::string_view uuidText) {
  return Operation::create(metaModel_, itemId(uuidText), std::move(name));
}

Argument AbstractMetaPackage::createArgument(std::u16string name, std::string_view uuidText) {
  return Argument::create(metaModel_, itemId(uuidText), std::move(name));
}

void AbstractMetaPackage::registerRootPackage(const Package& package) {
  MetaRegistry::getInstance().registerRootPackage(package);
}

void AbstractMetaPackage::unregisterRootPackage(std::u16string_view uri) {
  MetaRegistry::getInstance().unregisterRootPackage(uri);
}

}  // namespace qf::zero::meta
