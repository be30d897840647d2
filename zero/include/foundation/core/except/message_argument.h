#pragma once

#include <concepts>
#include <cstdint>
#include <limits>
#include <string>
#include <string_view>
#include <type_traits>
#include <utility>
#include <variant>
#include <vector>

namespace foundation::core::except {

// One argument of a message. Text keeps the width it was given in: UTF-16 text stays wide,
// narrow (UTF-8) text stays narrow, so a message can be compared and transported without
// guessing encodings. Integers are held as int64.
using MessageArgument = std::variant<std::string, std::u16string, std::int64_t>;

// Integral types that are numbers. Character types and bool are excluded: a char is text or
// a byte, never a count, and bool converting to 0/1 would hide mistakes.
template <class T>
concept MessageInteger =
    std::integral<T> && !std::same_as<std::remove_cv_t<T>, bool> &&
    !std::same_as<std::remove_cv_t<T>, char> && !std::same_as<std::remove_cv_t<T>, signed char> &&
    !std::same_as<std::remove_cv_t<T>, unsigned char> && !std::same_as<std::remove_cv_t<T>, wchar_t> &&
    !std::same_as<std::remove_cv_t<T>, char8_t> && !std::same_as<std::remove_cv_t<T>, char16_t> &&
    !std::same_as<std::remove_cv_t<T>, char32_t>;

inline MessageArgument toMessageArgument(MessageArgument argument) { return argument; }
inline MessageArgument toMessageArgument(std::string text) { return MessageArgument(std::move(text)); }
inline MessageArgument toMessageArgument(std::string_view text) { return MessageArgument(std::string(text)); }
inline MessageArgument toMessageArgument(const char* text) { return MessageArgument(std::string(text)); }
inline MessageArgument toMessageArgument(std::u16string text) { return MessageArgument(std::move(text)); }
inline MessageArgument toMessageArgument(std::u16string_view text) {
  return MessageArgument(std::u16string(text));
}
inline MessageArgument toMessageArgument(const char16_t* text) {
  return MessageArgument(std::u16string(text));
}

// An unsigned value beyond int64 cannot be held as a number; its decimal text is kept instead
// so the message still shows the exact value.
template <MessageInteger T>
MessageArgument toMessageArgument(T value) {
  if constexpr (std::is_unsigned_v<T>) {
    if (value > static_cast<std::make_unsigned_t<std::int64_t>>(std::numeric_limits<std::int64_t>::max()))
      return MessageArgument(std::to_string(value));
  }
  return MessageArgument(static_cast<std::int64_t>(value));
}

template <class... Args>
std::vector<MessageArgument> makeArguments(Args&&... args) {
  std::vector<MessageArgument> result;
  result.reserve(sizeof...(Args));
  (result.push_back(toMessageArgument(std::forward<Args>(args))), ...);
  return result;
}

// Constructor parameter types of message classes. Each accepts every spelling of its kind of
// value implicitly (literal, owning string, view, any integral type) and nothing else, so a
// message declared to take UTF-16 text rejects narrow text at compile time.
class WideTextParameter {
 public:
  WideTextParameter(const char16_t* text) : value_(std::u16string(text)) {}
  WideTextParameter(std::u16string text) : value_(std::move(text)) {}
  WideTextParameter(std::u16string_view text) : value_(std::u16string(text)) {}
  MessageArgument take() && { return std::move(value_); }

 private:
  MessageArgument value_;
};

// Narrow (UTF-8) text: a literal, a std::string or a view.
class NarrowTextParameter {
 public:
  NarrowTextParameter(const char* text) : value_(std::string(text)) {}
  NarrowTextParameter(std::string text) : value_(std::move(text)) {}
  NarrowTextParameter(std::string_view text) : value_(std::string(text)) {}
  MessageArgument take() && { return std::move(value_); }

 private:
  MessageArgument value_;
};

// A value of any integer type; bool and the character types are refused at compile time.
class IntegerParameter {
 public:
  template <MessageInteger T>
  IntegerParameter(T value) : value_(toMessageArgument(value)) {}
  MessageArgument take() && { return std::move(value_); }

 private:
  MessageArgument value_;
};

// For arguments that may be narrow or wide, e.g. a type name that is UTF-16 when it comes from
// a metamodel and narrow when it comes from C++.
class AnyParameter {
 public:
  AnyParameter(MessageArgument value) : value_(std::move(value)) {}
  AnyParameter(const char* text) : value_(std::string(text)) {}
  AnyParameter(std::string text) : value_(std::move(text)) {}
  AnyParameter(std::string_view text) : value_(std::string(text)) {}
  AnyParameter(const char16_t* text) : value_(std::u16string(text)) {}
  AnyParameter(std::u16string text) : value_(std::move(text)) {}
  AnyParameter(std::u16string_view text) : value_(std::u16string(text)) {}
  template <MessageInteger T>
  AnyParameter(T value) : value_(toMessageArgument(value)) {}
  MessageArgument take() && { return std::move(value_); }

 private:
  MessageArgument value_;
};

namespace detail {
template <class T>
struct ParameterFor;
template <>
struct ParameterFor<std::u16string> {
  using type = WideTextParameter;
};
template <>
struct ParameterFor<std::string> {
  using type = NarrowTextParameter;
};
template <>
struct ParameterFor<std::int64_t> {
  using type = IntegerParameter;
};
template <>
struct ParameterFor<MessageArgument> {
  using type = AnyParameter;
};
}  // namespace detail

// The parameter type a message class takes for an argument declared as T. Declared argument
// types are std::u16string, std::string, std::int64_t and MessageArgument.
template <class T>
using MessageParameter = typename detail::ParameterFor<T>::type;

}  // namespace foundation::core::except
