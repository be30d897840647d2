// The ready-made property serializers: enumerations written as literal names, and
// in-memory values that have no persistent form.
//
//   registry.registerPropertySerializer(colourEnum,
//   std::make_unique<DefaultPropertySerializer<Colour>>(colourEnum));
//   registry.registerPropertySerializer(handleType,
//   std::make_unique<TransientOnlyPropertySerializer<Handle>>());
#pragma once

#include "qf/zero/core/messages.h"
#include "qf/zero/core/meta/enum.h"
#include "qf/zero/core/meta/property_serializer.h"
#include "qf/zero/core/report_exception.h"
#include "qf/zero/core/text.h"

#include <nlohmann/json.hpp>

#include <string>
#include <utility>

namespace qf::zero::meta {

// Writes a C++ enumeration E as the name of its literal in `metaEnum`.
template <class E>
class DefaultPropertySerializer final : public PropertySerializer {
 public:
  explicit DefaultPropertySerializer(Enum metaEnum) : enum_(std::move(metaEnum)) {}

  nlohmann::ordered_json toJson(const Value& value) const override {
    const EnumLiteral literal = enum_->findLiteral(static_cast<int>(value.getValue<E>()));
    if (!literal) reportException(qf0::messages::InvalidValue());
    return toUtf8(literal.getName());
  }
  Value fromJson(const nlohmann::ordered_json& json, const Property& property) const override {
    if (!json.is_string()) reportException(qf0::messages::InvalidValue());
    const EnumLiteral literal = enum_->findLiteral(toUtf16(json.get_ref<const std::string&>()));
    if (!literal) reportException(qf0::messages::InvalidValue());
    return Value::createPrimitiveValue(property, static_cast<E>(literal.getValue()));
  }

 private:
  Enum enum_;
};

// For values that live only in memory (handles to threads, sockets, callbacks).
template <class T>
class TransientOnlyPropertySerializer final : public PropertySerializer {
 public:
  bool isSerializable() const noexcept override { return false; }
  nlohmann::ordered_json toJson(const Value&) const override { return nullptr; }
  Value fromJson(const nlohmann::ordered_json&, const Property&) const override { return Value(); }
};

}  // namespace qf::zero::meta
