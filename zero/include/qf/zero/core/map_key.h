// MapKey: the key of a map collection, taken from a property of its items.
#pragma once

#include "qf/zero/core/fwd.h"
#include "qf/zero/core/uuid.h"

#include <boost/optional.hpp>

#include <string>
#include <variant>

namespace qf::zero {

// monostate: the item has no value for the key property.
using MapKey = std::variant<std::monostate, bool, int, std::u16string, Uuid>;

// The key of an item whose key property holds `value`.
MapKey mapKeyFromValue(const Value& value);

// A map key as the key type K of a typed map container.
template <class K>
K mapKeyAs(const MapKey& key) {
  if constexpr (std::is_same_v<K, MapKey>) {
    return key;
  } else {
    if (const K* typed = std::get_if<K>(&key)) return *typed;
    return K{};
  }
}

}  // namespace qf::zero
