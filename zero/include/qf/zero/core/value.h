// Value: one property value for reflective access: an element, a primitive or
// datatype value, a list of values, or a view of a many-valued property's collection.
//
//   Value v = Value::of(42);
//   int n = v.getValue<int>();            // 42
//   v.getValue<std::u16string>();         // raises "CannotCastIncompatibleTypes"
//
// A many-valued property reads as a live view of its collection, valid while the element
// lives; changes through it are checked and recorded like setters:
//
//   auto* books = shelf.getPropertyValue(booksProperty).getValue<ReferenceCollection*>();
//   books->add(book);
//   auto* tags = book.getPropertyValue(tagsProperty).getValue<PrimitiveCollection*>();
//   tags->genericAdd(Value::of(std::u16string(u"desert")));
//   // getValue<AbstractOwnedCollection*>() reads either kind; size() and genericAt(i) walk it.
//
// A run-time enumeration's value is its literal element; a generated enumeration's is
// its C++ enum:
//
//   book.setPropertyValue(genre, Value::createElementValue(fictionLiteral));
//   elementCast<meta::EnumLiteral>(book.getPropertyValue(genre).getElement()).getName();
//   generatedBook.getPropertyValue(genreProperty).getValue<Genre>();   // Genre::Fiction
//
// Values are immutable once made and cheap to copy (the payload is shared).
#pragma once

#include "qf/zero/core/internal/element_impl.h"
#include "qf/zero/core/messages.h"
#include "qf/zero/core/meta/property.h"
#include "qf/zero/core/model_element.h"
#include "qf/zero/core/report_exception.h"
#include "qf/zero/core/text.h"

#include <boost/core/demangle.hpp>
#include <boost/optional.hpp>

#include <concepts>
#include <memory>
#include <string>
#include <type_traits>
#include <typeinfo>
#include <vector>

namespace qf::zero {

// What a value belongs to: the property it was read from, and whether the property
// keeps ownership of what the value refers to (a collection view is unmanaged).
class ValueMeta {
 public:
  ValueMeta() = default;
  explicit ValueMeta(meta::Property property) : property_(std::move(property)) {}
  const meta::Property& getProperty() const noexcept { return property_; }
  bool isUnmanaged() const noexcept { return unmanaged_; }
  void setUnmanaged(bool unmanaged = true) noexcept { unmanaged_ = unmanaged; }

 private:
  meta::Property property_;
  bool unmanaged_ = false;
};

namespace internal {

template <class T>
struct IsBoostOptional : std::false_type {};
template <class T>
struct IsBoostOptional<boost::optional<T>> : std::true_type {};

// The name of T in "CannotCastIncompatibleTypes": the framework's type name where
// there is one, the class's qualified name for element handles, else the C++ name.
template <class T>
foundation::core::except::MessageArgument typeNameOf();

}  // namespace internal

// An immutable property value for reflective access, cheap to copy. getValue<T>() reads it as
// T and raises "CannotCastIncompatibleTypes" for any other T.
class Value {
 public:
  Value() = default;

  template <class T>
  static Value of(T value, ValueMeta meta = {});
  // An element: a reference's target or a run-time enumeration's literal. A null
  // handle gives an empty value (an unset optional reference).
  static Value createElementValue(const ModelElement& element, const meta::Property& property = {});
  template <class T>
  static Value createPrimitiveValue(const meta::Property& property, T value) {
    return of(std::move(value), ValueMeta(property));
  }
  // The contents of a many-valued property, in iteration order.
  static Value list(std::vector<Value> items, const meta::Property& property = {});
  // A live view of a collection owned by an element; unmanaged.
  static Value collectionView(AbstractOwnedCollection* collection, const meta::Property& property);

  bool isEmpty() const noexcept { return kind_ == Kind::Empty; }
  bool isElement() const noexcept { return kind_ == Kind::Element; }
  bool isList() const noexcept { return holds<std::vector<Value>>(); }
  const ModelElement& getElement() const noexcept { return element_; }
  const std::vector<Value>& getList() const;

  const ValueMeta& getMeta() const noexcept { return meta_; }
  Value& setUnmanaged() noexcept {
    meta_.setUnmanaged();
    return *this;
  }

  // The C++ type held (void for an empty value, ModelElement for an element).
  const std::type_info& heldType() const noexcept;
  template <class T>
  bool holds() const noexcept {
    return holder_ && holder_->type() == typeid(T);
  }

  // Raises "CannotCastIncompatibleTypes" naming T when the value cannot be read as T.
  template <class T>
  void checkCompatible() const {
    (void)getValue<T>();
  }
  // Reads the value as T. Element handles convert to any handle type the element
  // is an instance of; an empty value reads as a null handle or an empty optional.
  // A pointer to a collection class (ReferenceCollection*, PrimitiveCollection*,
  // AbstractOwnedCollection*) reads a collection view; the value does not own it.
  template <class T>
  T getValue() const;
  // The held T itself, without a copy; null when the value holds no T (no conversion is
  // tried). Valid while this value lives.
  template <class T>
  const T* peek() const noexcept {
    return holds<T>() ? &static_cast<const TypedHolder<T>&>(*holder_).value : nullptr;
  }

  friend bool operator==(const Value& a, const Value& b);

 private:
  struct Holder {
    virtual ~Holder() = default;
    virtual const std::type_info& type() const noexcept = 0;
    virtual bool equals(const Holder& other) const = 0;
  };
  template <class T>
  struct TypedHolder final : Holder {
    explicit TypedHolder(T v) : value(std::move(v)) {}
    const std::type_info& type() const noexcept override { return typeid(T); }
    bool equals(const Holder& other) const override {
      if (other.type() != typeid(T)) return false;
      if constexpr (std::equality_comparable<T>) {
        return value == static_cast<const TypedHolder&>(other).value;
      } else {
        return this == &other;
      }
    }
    T value;
  };
  enum class Kind : std::uint8_t { Empty, Element, Other };

  template <class T>
  [[noreturn]] static void raiseIncompatible() {
    reportException(qf0::messages::CannotCastIncompatibleTypes(internal::typeNameOf<T>()));
  }
  AbstractOwnedCollection* collectionPointer() const noexcept;

  ValueMeta meta_;
  Kind kind_ = Kind::Empty;
  ModelElement element_;
  std::shared_ptr<const Holder> holder_;
};

template <class T>
Value Value::of(T value, ValueMeta meta) {
  Value result;
  result.meta_ = std::move(meta);
  if constexpr (std::is_base_of_v<ModelElement, T>) {
    if (value) {
      result.kind_ = Kind::Element;
      result.element_ = std::move(value);
    }
  } else {
    result.kind_ = Kind::Other;
    result.holder_ = std::make_shared<TypedHolder<T>>(std::move(value));
  }
  return result;
}

template <class T>
T Value::getValue() const {
  if constexpr (std::is_base_of_v<ModelElement, T>) {
    if (kind_ == Kind::Empty) return T();
    if (kind_ != Kind::Element) raiseIncompatible<T>();
    if constexpr (std::is_same_v<T, ModelElement>) {
      return element_;
    } else {
      T typed = elementCast<T>(element_);
      if (!typed) raiseIncompatible<T>();
      return typed;
    }
  } else if constexpr (internal::IsBoostOptional<T>::value) {
    if (holds<T>()) return static_cast<const TypedHolder<T>&>(*holder_).value;
    if (kind_ == Kind::Empty) return T();
    return T(getValue<typename T::value_type>());
  } else if constexpr (std::is_pointer_v<T> && std::is_polymorphic_v<std::remove_pointer_t<T>>) {
    if (holds<T>()) return static_cast<const TypedHolder<T>&>(*holder_).value;
    if (auto* typed = dynamic_cast<T>(collectionPointer())) return typed;
    raiseIncompatible<T>();
  } else {
    if (!holds<T>()) raiseIncompatible<T>();
    return static_cast<const TypedHolder<T>&>(*holder_).value;
  }
}

namespace internal {

template <class T>
foundation::core::except::MessageArgument typeNameOf() {
  if constexpr (std::is_same_v<T, std::u16string>) {
    return std::u16string(u"String");
  } else if constexpr (std::is_same_v<T, bool>) {
    return std::u16string(u"Boolean");
  } else if constexpr (std::is_same_v<T, int>) {
    return std::u16string(u"Integer");
  } else if constexpr (std::is_same_v<T, Uuid>) {
    return std::u16string(u"UUID");
  } else if constexpr (requires { T::metaClass(); }) {
    return T::metaClass().getQualifiedName();
  } else {
    return boost::core::demangle(typeid(T).name());
  }
}

}  // namespace internal

}  // namespace qf::zero
