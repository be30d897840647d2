// The framework's own metamodel package ("/qf0/meta/20160101"): its primitive types
// "String", "Boolean", "Integer", "UUID", "DateTime", "JsonValue", "HxArray", the
// classes "ModelElement" and "Model", and the classes of the metamodel items.
// Built and registered on first use of the MetaRegistry.
#pragma once

#include "qf/zero/core/meta/primitive_type.h"
#include "qf/zero/core/meta/structured_type.h"
#include "qf/zero/core/value.h"

#include <boost/date_time/posix_time/ptime.hpp>

#include <nlohmann/json_fwd.hpp>

#include <functional>
#include <string>
#include <vector>

namespace qf::zero {

// A callback of the host environment, called with an array of values.
using HxArray = std::function<std::vector<Value>(const std::vector<Value>&)>;
using DateTime = boost::posix_time::ptime;
using JsonValue = nlohmann::ordered_json;

namespace meta {

inline constexpr char16_t kFrameworkPackageUri[] = u"/qf0/meta/20160101";

// The class of a metamodel item by its class name ("Class", "Property" ...).
Class frameworkMetaClass(std::u16string_view name);

}  // namespace meta
}  // namespace qf::zero
