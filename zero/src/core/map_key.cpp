#include "qf/zero/core/map_key.h"

#include "qf/zero/core/value.h"

namespace qf::zero {

MapKey mapKeyFromValue(const Value& value) {
  if (value.holds<std::u16string>()) return value.getValue<std::u16string>();
  if (value.holds<Uuid>()) return value.getValue<Uuid>();
  if (value.holds<boost::optional<Uuid>>()) {
    const auto id = value.getValue<boost::optional<Uuid>>();
    return id ? MapKey(*id) : MapKey();
  }
  if (value.holds<int>()) return value.getValue<int>();
  if (value.holds<bool>()) return value.getValue<bool>();
  return MapKey();
}

}  // namespace qf::zero
