// ElementId: how a document names an element.
#pragma once

#include "qf/zero/core/uuid.h"

#include <boost/optional.hpp>

namespace qf::zero::io {

// The identity a document gives an entry; an entry without a UUID makes an element with a
// fresh one.
struct ElementId {
  // Absent for an entry that carries no identity: the element gets a fresh UUID.
  boost::optional<Uuid> uuid;

  friend bool operator==(const ElementId&, const ElementId&) = default;
};

}  // namespace qf::zero::io
