// PrimitiveType: a value type without structure (String, Integer, UUID ...), and the
// ValueTraits that tell the framework how to make, parse and print its values.
#pragma once

#include "qf/zero/core/meta/type.h"

#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <typeinfo>

namespace qf::zero::meta {

// What the framework needs to know of a primitive type's values. Traits are immutable
// and shared between threads.
class ValueTraits {
 public:
  virtual ~ValueTraits() = default;
  virtual const std::type_info& cppType() const noexcept = 0;
  // The value of a property of this type that was never set ("", false, 0 ...).
  virtual Value defaultValue() const = 0;
  // Parses the text form (used for default values and attribute text); empty when the
  // text is not a value of this type.
  virtual std::optional<Value> parseText(std::u16string_view text) const = 0;
  virtual std::u16string toText(const Value& value) const = 0;
};

// A value type without structure; its ValueTraits make, parse and print its values.
class PrimitiveType : public Type {
  QF_ZERO_HANDLE(PrimitiveType, Type)
  static PrimitiveType create(const Model& model, const Uuid& id, std::u16string name,
                              std::u16string qualifiedName, std::shared_ptr<const ValueTraits> traits);
};

// The traits of a primitive type, shared and immutable.
class PrimitiveType::Impl : public Type::Impl {
 public:
  Impl(std::u16string name, std::u16string qualifiedName, std::shared_ptr<const ValueTraits> traits)
      : Type::Impl(std::move(name), std::move(qualifiedName)), traits_(std::move(traits)) {}
  // Null for an opaque type whose values only their own code reads.
  const ValueTraits* getTraits() const noexcept { return traits_.get(); }

 protected:
  std::u16string_view metaClassName() const override { return u"PrimitiveType"; }

 private:
  std::shared_ptr<const ValueTraits> traits_;
};

}  // namespace qf::zero::meta
