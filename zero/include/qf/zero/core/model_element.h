// ModelElement: the handle every element class derives from.
//
// A handle is a cheap value over a reference-counted implementation (`Impl`).
// Handles compare and hash by identity; a default-constructed handle is null and
// tests false. A handle keeps its element's memory alive, not its life: a destroyed
// element's handle stays valid and reports `isLive() == false`.
//
//   ModelElement book = bookClass->instantiate(model);
//   book.setPropertyValue(title, Value::of(std::u16string(u"Dune")));
#pragma once

#include "qf/zero/core/fwd.h"
#include "qf/zero/core/ref_counted.h"
#include "qf/zero/core/uuid.h"

#include <functional>
#include <string>
#include <vector>

namespace qf::zero {

// The handle of an element: a counted reference to its implementation, cheap to copy, null
// when default-made; == compares identity. Access through it is reflective, by metamodel
// property; a generated handle adds typed access.
class ModelElement {
 public:
  class Impl;
  class Builder;
  class Constrainables;

  ModelElement() noexcept = default;
  explicit ModelElement(Impl* impl) noexcept;
  explicit ModelElement(IntrusivePtr<Impl> impl) noexcept : impl_(std::move(impl)) {}
  ModelElement(const ModelElement&) noexcept = default;
  ModelElement(ModelElement&&) noexcept = default;
  ModelElement& operator=(const ModelElement&) noexcept = default;
  ModelElement& operator=(ModelElement&&) noexcept = default;
  ~ModelElement() = default;

  explicit operator bool() const noexcept { return impl_.get() != nullptr; }
  bool isNull() const noexcept { return impl_.get() == nullptr; }
  Impl* getImpl() const noexcept { return impl_.get(); }
  Impl* operator->() const noexcept { return impl_.get(); }

  // REQUIRES for all below: a non-null handle.
  const Uuid& getUuid() const;
  std::string identifier() const;
  Model getModel() const;
  meta::Class getMetaClass() const;
  bool isLive() const;
  bool isProxy() const;
  bool isTopLevel() const;
  ModelElement container() const;
  meta::Property containmentFeature() const;

  Value getPropertyValue(const meta::Property& property) const;
  void setPropertyValue(const meta::Property& property, const Value& value);
  bool hasPropertyValue(const meta::Property& property) const;
  Value invoke(const meta::Operation& operation, std::vector<Value> arguments);

  // Destroys this element and its contained subtree; see Impl::destroy.
  void destroy();

  // The framework's root class "ModelElement".
  static meta::Class metaClass();

  friend bool operator==(const ModelElement& a, const ModelElement& b) noexcept { return a.impl_ == b.impl_; }

 protected:
  // The implementation as the derived handle's Impl. Unchecked: a handle of type T only
  // ever holds a T::Impl.
  template <class ImplT>
  ImplT* as() const noexcept {
    return static_cast<ImplT*>(impl_.get());
  }

  IntrusivePtr<Impl> impl_;
};

// Declares the members every derived handle has: its Impl, construction from an
// implementation, and typed access to it.
//
// The accessors are templates so that a header declaring a handle does not need the
// complete Impl: only code that reaches into the implementation does.
#define QF_ZERO_HANDLE(Name, Base)                                             \
 public:                                                                       \
  class Impl;                                                                  \
  Name() noexcept = default;                                                   \
  explicit Name(::qf::zero::ModelElement::Impl* impl) noexcept : Base(impl) {} \
  template <class ImplT = Impl>                                                \
  ImplT* operator->() const noexcept {                                         \
    return this->template as<ImplT>();                                         \
  }                                                                            \
  template <class ImplT = Impl>                                                \
  ImplT* getImpl() const noexcept {                                            \
    return this->template as<ImplT>();                                         \
  }

// The typed handle T of `element`, or a null T when the element is not of T's class.
template <class T>
T elementCast(const ModelElement& element);

}  // namespace qf::zero

// Hashes by identity, consistent with ==.
template <>
struct std::hash<qf::zero::ModelElement> {
  std::size_t operator()(const qf::zero::ModelElement& e) const noexcept {
    return std::hash<const void*>()(e.getImpl());
  }
};
