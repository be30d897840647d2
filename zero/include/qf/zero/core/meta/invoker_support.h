// Helpers of generated invokers: unpacking argument values into C++ values and packing
// results back into values, and finding the element an operation is called on.
//
//   [](ModelElement::Impl& element, std::vector<Value>& arguments) -> Value {
//     auto& book = invoker::target<Book::Impl>(element, u"lend");
//     return invoker::result(book.lend(invoker::argument<Reader>(arguments[0])));
//   }
#pragma once

#include "qf/zero/core/internal/element_impl.h"
#include "qf/zero/core/messages.h"
#include "qf/zero/core/meta/structured_type.h"
#include "qf/zero/core/report_exception.h"
#include "qf/zero/core/value.h"

#include <boost/optional.hpp>

#include <string>
#include <type_traits>
#include <utility>
#include <vector>

namespace qf::zero::meta::invoker {

namespace internal {
template <class T>
struct IsVector : std::false_type {};
template <class T, class A>
struct IsVector<std::vector<T, A>> : std::true_type {};
}  // namespace internal

// The element as the implementation class that declares the operation; raises
// "NoSuchOperation" when the element is of another class.
template <class ImplT>
ImplT& target(ModelElement::Impl& element, std::u16string_view operation) {
  auto* typed = dynamic_cast<ImplT*>(&element);
  if (typed == nullptr) {
    reportException(
        qf0::messages::NoSuchOperation(element.getMetaClass().getQualifiedName(), std::u16string(operation)));
  }
  return *typed;
}

// An argument value as T: a list value for a std::vector, the value itself otherwise.
template <class T>
T argument(const Value& value) {
  if constexpr (std::is_same_v<T, Value>) {
    return value;
  } else if constexpr (internal::IsVector<T>::value) {
    T items;
    if (value.isEmpty()) return items;
    for (const Value& item : value.getList()) items.push_back(argument<typename T::value_type>(item));
    return items;
  } else {
    return value.getValue<T>();
  }
}

// A result as a value: elements as element values, vectors as lists, an empty optional
// as the empty value.
template <class T>
Value result(T value) {
  if constexpr (std::is_same_v<T, Value>) {
    return value;
  } else if constexpr (std::is_base_of_v<ModelElement, T>) {
    return Value::createElementValue(value);
  } else if constexpr (internal::IsVector<T>::value) {
    std::vector<Value> items;
    items.reserve(value.size());
    for (auto& item : value) items.push_back(result(std::move(item)));
    return Value::list(std::move(items));
  } else if constexpr (qf::zero::internal::IsBoostOptional<T>::value) {
    return value ? result(std::move(*value)) : Value();
  } else {
    return Value::of(std::move(value));
  }
}

}  // namespace qf::zero::meta::invoker
