// Value traits of opaque primitive types: values that only their own code reads, such
// as shared pointers to collaborators. They have a default (the value-initialised T)
// and no text form.
#pragma once

#include "qf/zero/core/meta/primitive_type.h"
#include "qf/zero/core/value.h"

#include <optional>
#include <string>
#include <typeinfo>

namespace qf::zero::meta {

// Traits of values of T that only their own code reads: the default is T{}, and there is no
// text form, so such values are never parsed or printed.
template <class T>
class OpaqueValueTraits final : public ValueTraits {
 public:
  const std::type_info& cppType() const noexcept override { return typeid(T); }
  Value defaultValue() const override { return Value::of(T{}); }
  std::optional<Value> parseText(std::u16string_view) const override { return std::nullopt; }
  std::u16string toText(const Value&) const override { return {}; }
};

}  // namespace qf::zero::meta
