#pragma once

#include "foundation/core/except/exception.h"
#include "foundation/core/except/message.h"

#include <exception>
#include <type_traits>

namespace qf::zero {

// The single way the project raises an error: throws the exception for the message's exact type,
// so callers can catch Exception<M> for one message or ExceptionBase for all of them.
template <class M>
requires std::is_base_of_v<foundation::core::except::Message, M>
[[noreturn]] void reportException(const M& message) {
  throw foundation::core::except::Exception<M, std::exception, void>(message);
}

}  // namespace qf::zero
