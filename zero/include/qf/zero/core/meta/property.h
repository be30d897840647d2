// TypedElement and Property: typed, bounded metamodel items; a Property is one
// feature of a class or datatype.
#pragma once

#include "qf/zero/core/meta/named_element.h"

#include <optional>
#include <string>

namespace qf::zero::meta {

// The kind of a property, as given when it is made.
enum class ValueFlags : int {
  Optional = 0,  // a single value that may be absent
  Single = 1,    // a single value
  Sequence = 2,  // an ordered sequence
  Set = 4,       // an unordered set
  Map = 6        // a map keyed by a property of the target ("qualified by")
};

class TypedElement : public NamedElement {
  QF_ZERO_HANDLE(TypedElement, NamedElement)
};

// The type and the multiplicity bounds of a property, argument or operation.
class TypedElement::Impl : public NamedElement::Impl {
 public:
  Type getType() const;
  void setType(const Type& type);
  int getLower() const noexcept { return lower_; }
  void setLower(int lower) noexcept { lower_ = lower; }
  // -1: unbounded.
  int getUpper() const noexcept { return upper_; }
  void setUpper(int upper) noexcept { upper_ = upper; }
  bool isOrdered() const noexcept { return isOrdered_; }
  void setIsOrdered(bool ordered) noexcept { isOrdered_ = ordered; }
  void invalidate() override;

 protected:
  using NamedElement::Impl::Impl;

 private:
  IntrusivePtr<ModelElement::Impl> type_;
  int lower_ = 0;
  int upper_ = 1;
  bool isOrdered_ = false;
};

// One feature of a class or datatype. Its kind (ValueFlags), type and index decide how
// elements hold, check and record its values.
class Property : public TypedElement {
  QF_ZERO_HANDLE(Property, TypedElement)
  static Property create(const Model& model, const Uuid& id, std::u16string name, ValueFlags flags,
                         bool isComposite);
  int getIndex() const;
  std::u16string getQualifiedName() const;  // "package.Class.property"
};

// A property's definition: kind, containment, index, flags, opposite, map key and default.
// Set while the metamodel is built; read-only afterwards.
class Property::Impl : public TypedElement::Impl {
 public:
  Impl(std::u16string name, ValueFlags flags, bool isComposite)
      : TypedElement::Impl(std::move(name)), flags_(flags), isComposite_(isComposite) {}

  ValueFlags getValueFlags() const noexcept { return flags_; }
  bool isMany() const noexcept { return static_cast<int>(flags_) >= static_cast<int>(ValueFlags::Sequence); }
  bool isOptional() const noexcept { return flags_ == ValueFlags::Optional; }
  bool isSequence() const noexcept { return flags_ == ValueFlags::Sequence; }
  bool isSet() const noexcept { return flags_ == ValueFlags::Set; }
  bool isMap() const noexcept { return flags_ == ValueFlags::Map; }
  bool isComposite() const noexcept { return isComposite_; }
  // Typed by a class.
  bool isReference() const;
  bool isContainment() const { return isComposite_ && isReference(); }

  int getIndex() const noexcept { return index_; }
  void setPropertyIndex(int index) noexcept { index_ = index; }
  StructuredType getOwningType() const;
  void setOwningType(const StructuredType& type);
  std::u16string getQualifiedName() const;

  bool isReadOnly() const noexcept { return isReadOnly_; }
  void setIsReadOnly(bool value) noexcept { isReadOnly_ = value; }
  bool isSetOnce() const noexcept { return isSetOnce_; }
  void setIsSetOnce(bool value) noexcept { isSetOnce_ = value; }
  bool isTransient() const noexcept { return isTransient_; }
  void setIsTransient(bool value) noexcept { isTransient_ = value; }
  bool isUnique() const noexcept { return isUnique_; }
  void setIsUnique(bool value) noexcept { isUnique_ = value; }
  bool isQualificationUnique() const noexcept { return isQualificationUnique_; }
  void setIsQualificationUnique(bool value) noexcept { isQualificationUnique_ = value; }
  bool isPublicAccessor() const noexcept { return isPublicAccessor_; }
  void setIsPublicAccessor(bool value) noexcept { isPublicAccessor_ = value; }
  bool isPublicMutator() const noexcept { return isPublicMutator_; }
  void setIsPublicMutator(bool value) noexcept { isPublicMutator_ = value; }

  Property getOpposite() const;
  // Sets this end only; the caller sets the other end too.
  void setOpposite(const Property& opposite);
  // For a map: the property of the target whose value is the key.
  Property getQualifiedBy() const;
  void setQualifiedBy(const Property& key);

  // The default as text, parsed by the property's type; none: the type's own default.
  const std::optional<std::u16string>& getDefaultValueText() const noexcept { return defaultText_; }
  void setDefaultValue(std::optional<std::u16string> text) { defaultText_ = std::move(text); }
  // The value a new element holds: parsed default, the type's default, or empty for
  // references, optional values and types without traits.
  Value getDefaultValue() const;

  void invalidate() override;

 protected:
  std::u16string_view metaClassName() const override { return u"Property"; }

 private:
  ValueFlags flags_;
  bool isComposite_;
  bool isReadOnly_ = false;
  bool isSetOnce_ = false;
  bool isTransient_ = false;
  bool isUnique_ = false;
  bool isQualificationUnique_ = false;
  bool isPublicAccessor_ = true;
  bool isPublicMutator_ = true;
  int index_ = 0;
  // Back references held raw: the owning type and the opposite outlive the property
  // inside one metamodel, and holding them strongly would make cycles.
  ModelElement::Impl* owningType_ = nullptr;
  ModelElement::Impl* opposite_ = nullptr;
  IntrusivePtr<ModelElement::Impl> qualifiedBy_;
  std::optional<std::u16string> defaultText_;
};

inline int Property::getIndex() const { return getImpl()->getIndex(); }
inline std::u16string Property::getQualifiedName() const { return getImpl()->getQualifiedName(); }

}  // namespace qf::zero::meta

// Hashes by identity, consistent with ==.
template <>
struct std::hash<qf::zero::meta::Property> {
  std::size_t operator()(const qf::zero::meta::Property& p) const noexcept {
    return std::hash<const void*>()(p.getImpl());
  }
};
