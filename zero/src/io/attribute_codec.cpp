#include "attribute_codec.h"

#include "qf/zero/core/meta/enum.h"
#include "qf/zero/core/meta/framework_package.h"
#include "qf/zero/core/meta/primitive_type.h"
#include "qf/zero/core/text.h"

namespace qf::zero::io::internal {

AttributeCodec codecFor(const meta::Type& type) {
  AttributeCodec codec;
  const auto& registry = meta::PropertySerializerRegistry::getInstance();
  if (const auto* serializer = registry.getPropertySerializer(type)) {
    codec.kind = serializer->isSerializable() ? AttributeKind::Registered : AttributeKind::Opaque;
    codec.serializer = serializer;
    return codec;
  }
  if (elementCast<meta::Enum>(ModelElement(type))) {
    codec.kind = AttributeKind::Literal;
    return codec;
  }
  if (auto datatype = elementCast<meta::DataType>(ModelElement(type))) {
    codec.datatype = registry.getDatatypeSerializer(datatype);
    codec.kind = codec.datatype ? AttributeKind::Datatype : AttributeKind::Opaque;
    return codec;
  }
  auto primitive = elementCast<meta::PrimitiveType>(ModelElement(type));
  if (!primitive || !primitive->getTraits()) return codec;
  const std::type_info& held = primitive->getTraits()->cppType();
  if (held == typeid(std::u16string)) {
    codec.kind = AttributeKind::String;
  } else if (held == typeid(bool)) {
    codec.kind = AttributeKind::Boolean;
  } else if (held == typeid(int)) {
    codec.kind = AttributeKind::Integer;
  } else if (held == typeid(JsonValue)) {
    codec.kind = AttributeKind::Json;
  } else {
    codec.kind = AttributeKind::Text;
    codec.traits = primitive->getTraits();
  }
  return codec;
}

nlohmann::ordered_json writeAttribute(const meta::Property& property, const AttributeCodec& codec,
                                      const Value& value) {
  if (value.isEmpty()) return nullptr;
  switch (codec.kind) {
    case AttributeKind::String:
      return toUtf8(value.getValue<std::u16string>());
    case AttributeKind::Boolean:
      return value.getValue<bool>();
    case AttributeKind::Integer:
      return value.getValue<int>();
    case AttributeKind::Json:
      return value.getValue<JsonValue>();
    case AttributeKind::Text:
      return toUtf8(codec.traits->toText(value));
    case AttributeKind::Literal:
      return toUtf8(value.getValue<meta::EnumLiteral>().getName());
    case AttributeKind::Registered:
      return codec.serializer->toJson(value);
    case AttributeKind::Datatype: {
      nlohmann::ordered_json object = nlohmann::ordered_json::object();
      const auto datatype = elementCast<meta::DataType>(ModelElement(property->getType()));
      for (const meta::Property& member : datatype->getAllProperties()) {
        if (member->isTransient()) continue;
        const AttributeCodec memberCodec = codecFor(member->getType());
        if (memberCodec.kind == AttributeKind::Opaque) continue;
        object[toUtf8(member.getName())] =
            writeAttribute(member, memberCodec, codec.datatype->getPropertyValue(value, member));
      }
      return object;
    }
    case AttributeKind::Opaque:
      break;
  }
  return nullptr;
}

std::string describeJson(const nlohmann::ordered_json& json) {
  switch (json.type()) {
    case nlohmann::ordered_json::value_t::null:
      return "null";
    case nlohmann::ordered_json::value_t::object:
      return "an object";
    case nlohmann::ordered_json::value_t::array:
      return "an array";
    case nlohmann::ordered_json::value_t::string:
      return "a string";
    case nlohmann::ordered_json::value_t::boolean:
      return "a boolean";
    case nlohmann::ordered_json::value_t::number_float:
      return "a fractional number";
    case nlohmann::ordered_json::value_t::number_integer:
    case nlohmann::ordered_json::value_t::number_unsigned:
      return "an integer";
    default:
      return "a binary value";
  }
}

}  // namespace qf::zero::io::internal
