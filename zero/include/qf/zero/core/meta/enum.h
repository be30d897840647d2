// Enum and EnumLiteral. A property typed by a run-time enumeration holds the
// EnumLiteral element as its value; generated code may map literals to a C++ enum.
#pragma once

#include "qf/zero/core/meta/type.h"

#include <string_view>
#include <vector>

namespace qf::zero::meta {

// One literal of a run-time enumeration: a property typed by the enumeration holds this
// element as its value.
class EnumLiteral : public NamedElement {
  QF_ZERO_HANDLE(EnumLiteral, NamedElement)
  static EnumLiteral create(const Model& model, const Uuid& id, std::u16string name, int value);
  int getValue() const;
};

// A literal's integral value, fixed when it is made, and the enumeration that owns it.
class EnumLiteral::Impl : public NamedElement::Impl {
 public:
  Impl(std::u16string name, int value) : NamedElement::Impl(std::move(name)), value_(value) {}
  int getValue() const noexcept { return value_; }
  Enum getParentEnum() const;
  void setParentEnum(const Enum& parent);

 protected:
  std::u16string_view metaClassName() const override { return u"EnumLiteral"; }

 private:
  int value_;
  ModelElement::Impl* parent_ = nullptr;  // the owner; raw to avoid a cycle
};

// An enumeration defined at run time: literals in order, the first being the default value of
// the properties it types.
class Enum : public Type {
  QF_ZERO_HANDLE(Enum, Type)
  static Enum create(const Model& model, const Uuid& id, std::u16string name, std::u16string qualifiedName);
};

// The literals of an enumeration, found by name or by value, and the integral type of their
// values.
class Enum::Impl : public Type::Impl {
 public:
  Impl(std::u16string name, std::u16string qualifiedName)
      : Type::Impl(std::move(name), std::move(qualifiedName)) {}
  // Literals in the order added; the first is the default value.
  const std::vector<EnumLiteral>& getLiterals() const noexcept { return literals_; }
  void addLiteral(const EnumLiteral& literal);
  EnumLiteral findLiteral(std::u16string_view name) const;
  EnumLiteral findLiteral(int value) const;
  // The integral type of the literal values (Integer when unset).
  Type getUnderlyingType() const;
  void setUnderlyingType(const Type& type);
  void invalidate() override;

 protected:
  std::u16string_view metaClassName() const override { return u"Enum"; }

 private:
  std::vector<EnumLiteral> literals_;
  IntrusivePtr<ModelElement::Impl> underlyingType_;
};

inline int EnumLiteral::getValue() const { return getImpl()->getValue(); }

namespace internal {
// Whether values of `type` are enumeration literals.
inline bool isEnumType(const Type& type) { return static_cast<bool>(elementCast<Enum>(type)); }
}  // namespace internal

}  // namespace qf::zero::meta
