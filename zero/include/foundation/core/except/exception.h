#pragma once

#include "foundation/core/except/message.h"
#include "foundation/core/except/message_id.h"

#include <exception>
#include <memory>
#include <string>
#include <type_traits>
#include <utility>

namespace foundation::core::except {

// What every exception of the project has in common, whatever its message type: catch by
// `const ExceptionBase&` to handle all of them. Deliberately not derived from std::exception,
// so the concrete exception can choose its standard base without ambiguity.
class ExceptionBase {
 public:
  virtual ~ExceptionBase() = default;

  virtual const MessageId& GetBaseMsgIDObj() const noexcept = 0;

  // "catalog/key" of the message.
  std::string GetID() const { return GetBaseMsgIDObj().toString(); }

  // Rendered message text, valid as long as the exception.
  virtual const char* message() const noexcept = 0;

  // A heap copy of the exact dynamic type, e.g. to carry an exception across threads or out of
  // a catch block.
  virtual std::unique_ptr<ExceptionBase> clone() const = 0;

  // Throws a copy of the exact dynamic type, so handlers for the concrete type still match.
  [[noreturn]] virtual void rethrow() const = 0;

 protected:
  ExceptionBase() = default;
  ExceptionBase(const ExceptionBase&) = default;
  ExceptionBase& operator=(const ExceptionBase&) = default;
};

namespace detail {
struct NoExtra {};
}  // namespace detail

// The exception thrown for message type M: `catch (const Exception<M>&)` handles exactly that
// message. Base is the standard exception class it derives from. Extra, unless void, is a further
// base class: a second type to catch by, optionally carrying data given at construction.
//
// The message and its rendered text are shared between copies, so copying never throws, and
// what() / message() are noexcept and safe inside a handler.
template <class M, class Base = std::exception, class Extra = void>
class Exception final : public Base,
                        public ExceptionBase,
                        public std::conditional_t<std::is_void_v<Extra>, detail::NoExtra, Extra> {
  static_assert(std::is_base_of_v<Message, M>, "the message type must derive from Message");
  static_assert(std::is_base_of_v<std::exception, Base>, "the base must derive from std::exception");
  static_assert(std::is_default_constructible_v<Base> || std::is_constructible_v<Base, const std::string&>,
                "the base must be default constructible or constructible from its text");

  using ExtraBase = std::conditional_t<std::is_void_v<Extra>, detail::NoExtra, Extra>;

 public:
  explicit Exception(M message) : Exception(std::make_shared<const State>(std::move(message))) {}

  Exception(M message, ExtraBase extra) requires(!std::is_void_v<Extra>)
      : Exception(std::make_shared<const State>(std::move(message)), std::move(extra)) {}

  Exception(const Exception&) = default;
  Exception& operator=(const Exception&) = default;

  const M& getMessage() const noexcept { return state_->message; }

  const ExtraBase& extra() const noexcept requires(!std::is_void_v<Extra>) { return *this; }

  const char* what() const noexcept override { return state_->text.c_str(); }

  const MessageId& GetBaseMsgIDObj() const noexcept override { return state_->message.id(); }
  const char* message() const noexcept override { return state_->text.c_str(); }
  std::unique_ptr<ExceptionBase> clone() const override { return std::make_unique<Exception>(*this); }
  [[noreturn]] void rethrow() const override { throw Exception(*this); }

 private:
  struct State {
    explicit State(M m) : message(std::move(m)), text(message.id().render()) {}
    M message;
    std::string text;
  };

  // A base such as std::runtime_error gets the rendered text too, though what() is ours anyway.
  static Base makeBase(const State& state) {
    if constexpr (std::is_constructible_v<Base, const std::string&>)
      return Base(state.text);
    else
      return Base();
  }

  explicit Exception(std::shared_ptr<const State> state) : Base(makeBase(*state)), state_(std::move(state)) {}

  Exception(std::shared_ptr<const State> state, ExtraBase extra)
      : Base(makeBase(*state)), ExtraBase(std::move(extra)), state_(std::move(state)) {}

  // Never null: there is no moved-from state, since moving would leave what() dangling.
  std::shared_ptr<const State> state_;
};

}  // namespace foundation::core::except
