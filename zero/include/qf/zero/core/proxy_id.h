// The identity of an element that a reference names but that is not resident.
#pragma once

#include "qf/zero/core/uuid.h"

#include <boost/functional/hash.hpp>

#include <string>

namespace qf::zero {

// Names an element that is not resident: its UUID and the model that holds it.
struct ProxyId {
  Uuid elementId{};
  // The URI of the model that holds the element; empty for "the referring model".
  std::u16string modelUri;

  friend bool operator==(const ProxyId&, const ProxyId&) = default;
};

}  // namespace qf::zero

// Hashes the UUID and the model URI, consistent with ==.
template <>
struct std::hash<qf::zero::ProxyId> {
  std::size_t operator()(const qf::zero::ProxyId& id) const noexcept {
    std::size_t seed = boost::hash<qf::zero::Uuid>()(id.elementId);
    boost::hash_combine(seed, std::hash<std::u16string>()(id.modelUri));
    return seed;
  }
};
