#pragma once

#include "foundation/core/except/catalog.h"
#include "foundation/core/except/message_argument.h"
#include "foundation/core/except/message_id.h"

#include <string_view>
#include <utility>

namespace foundation::core::except {

// Base of every message class. A message class is named exactly as its catalog key and is
// constructed from its typed arguments; see FOUNDATION_MESSAGE.
class Message {
 public:
  explicit Message(MessageId id) : id_(std::move(id)) {}

  const MessageId& id() const noexcept { return id_; }

 private:
  MessageId id_;
};

// Implementation of FOUNDATION_MESSAGE. Derived supplies `key` and `messageCatalog()`; it is
// complete by the time the constructor is instantiated.
template <class Derived, class... Params>
class TypedMessage : public Message {
 public:
  explicit TypedMessage(MessageParameter<Params>... args)
      : Message(MessageId(Derived::messageCatalog(), Derived::key, collect(std::move(args)...))) {}

 private:
  template <class... Ps>
  static std::vector<MessageArgument> collect(Ps&&... parameters) {
    std::vector<MessageArgument> result;
    result.reserve(sizeof...(Ps));
    (result.push_back(std::move(parameters).take()), ...);
    return result;
  }
};

}  // namespace foundation::core::except

// Declares the message class Key of the catalog returned by CatalogFunction(), taking arguments
// of the listed types in placeholder order. Argument types are std::u16string, std::string,
// std::int64_t and MessageArgument (narrow or wide). Use inside the catalog's namespace:
//
//   FOUNDATION_MESSAGE(catalog, NoSuchType, std::u16string)
//   FOUNDATION_MESSAGE(catalog, ModelDestroyed)
#define FOUNDATION_MESSAGE(CatalogFunction, Key, ...)                                                \
  struct Key final : ::foundation::core::except::TypedMessage<Key __VA_OPT__(, ) __VA_ARGS__> {      \
    static constexpr ::std::string_view key = #Key;                                                  \
    static const ::foundation::core::except::Catalog& messageCatalog() { return CatalogFunction(); } \
    using ::foundation::core::except::TypedMessage<Key __VA_OPT__(, ) __VA_ARGS__>::TypedMessage;    \
  };
