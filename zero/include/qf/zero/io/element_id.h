// ElementId: how a document names an element.
#pragma once

#include "qf/zero/core/uuid.h"

#include <boost/optional.hpp>

namespace qf::zero::io {

struct ElementId {
  // Absent for an entry that carries no identity: the element gets a fresh UUID.
  boost::optional<Uuid> uuid;

  friend bool operator==(const ElementId&, const ElementId&) = default;
};

}  // namespace qf::zero::io
