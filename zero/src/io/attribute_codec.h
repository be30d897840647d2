// How attribute values (primitives, enumerations, datatypes) are written to JSON and
// read back. Shared by the serializer and the parser; the decision per property is
// made once and cached by the caller.
#pragma once

#include "qf/zero/core/meta/primitive_type.h"
#include "qf/zero/core/meta/property_serializer.h"
#include "qf/zero/core/value.h"

#include <nlohmann/json.hpp>

#include <string>

namespace qf::zero::io::internal {

enum class AttributeKind {
  String,      // JSON string
  Boolean,     // JSON boolean
  Integer,     // JSON number
  Json,        // the value itself
  Text,        // any other primitive with a text form (UUID, DateTime ...): JSON string
  Literal,     // a run-time enumeration: the literal's name
  Registered,  // a serializer from the registry decides
  Datatype,    // an object of the datatype's properties
  Opaque       // no persistent form: never written, never read
};

struct AttributeCodec {
  AttributeKind kind = AttributeKind::Opaque;
  const meta::PropertySerializer* serializer = nullptr;  // Registered
  const meta::ValueTraits* traits = nullptr;             // Text
  const meta::DatatypeSerializer* datatype = nullptr;    // Datatype
};

AttributeCodec codecFor(const meta::Type& type);

// Writes one value of `property` (one item of a many-valued one). An empty value is null.
nlohmann::ordered_json writeAttribute(const meta::Property& property, const AttributeCodec& codec,
                                      const Value& value);

// How a JSON value is named in "WrongJsonType": "a string", "null" ...
std::string describeJson(const nlohmann::ordered_json& json);

}  // namespace qf::zero::io::internal
