// The identity of an element that a reference names but that is not resident.
#pragma once

#include "qf/zero/core/uuid.h"

#include <boost/functional/hash.hpp>

#include <string>

namespace qf::zero {

struct ProxyId {
  Uuid elementId{};
  // The URI of the model that holds the element; empty for "the referring model".
  std::u16string modelUri;

  friend bool operator==(const ProxyId&, const ProxyId&) = default;
};

}  // namespace qf::zero

template <>
struct std::hash<qf::zero::ProxyId> {
  std::size_t operator()(const qf::zero::ProxyId& id) const noexcept {
    std::size_t seed = boost::hash<qf::zero::Uuid>()(id.elementId);
    boost::hash_combine(seed, std::hash<std::u16string>()(id.modelUri));
    return seed;
  }
};
