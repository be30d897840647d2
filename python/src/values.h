// Values of properties between C++ and Python, by the property's type:
//   String <-> str, Boolean <-> bool, Integer <-> int, UUID <-> uuid.UUID,
//   DateTime <-> datetime.datetime (naive, UTC), JsonValue <-> dict/list/str/number/None,
//   an enumeration's literal <-> its name (str), a reference <-> Element or None.
// A many-valued property reads as a live Collection view; setting one replaces its items.
#pragma once

#include "element_holder.h"
#include "qf/zero/core/meta/framework_package.h"
#include "qf/zero/core/meta/property.h"
#include "qf/zero/core/model_element.h"
#include "qf/zero/core/value.h"

#include <pybind11/pybind11.h>

namespace kiv::python {

// One item (or single value) of `property` as a Python object; None for an empty value.
pybind11::object toPython(const qf::zero::Value& value, const qf::zero::meta::Property& property);
// A Python object as one item (or single value) of `property`. Raises TypeError or
// ValueError for an object that cannot be one; None is the empty value.
qf::zero::Value fromPython(const pybind11::handle& object, const qf::zero::meta::Property& property);

pybind11::object uuidToPython(const qf::zero::Uuid& id);
qf::zero::Uuid uuidFromPython(const pybind11::handle& object);
pybind11::object jsonToPython(const qf::zero::JsonValue& json);
qf::zero::JsonValue jsonFromPython(const pybind11::handle& object);

// A property's value read through an element: single values converted, many-valued
// properties as a Collection view.
pybind11::object readProperty(const qf::zero::ModelElement& element,
                              const qf::zero::meta::Property& property);
void writeProperty(qf::zero::ModelElement element, const qf::zero::meta::Property& property,
                   const pybind11::handle& object);

// The property of the element's class named `name`; raises "NoSuchProperty".
qf::zero::meta::Property propertyNamed(const qf::zero::ModelElement& element, const std::string& name);

}  // namespace kiv::python
