// The parts of the Python module `kiv._kiv`, each binding one area of the C++ API.
//
// Naming rule: a C++ lowerCamel operation becomes a snake_case Python method
// (`commitTransaction` -> `commit_transaction`), C++ classes keep their names, and the
// catalog keys keep theirs as exception class names.
//
// The GIL: every call that may wait for another thread (push, pull, clone, waiting for
// notices) releases it; callbacks into Python from other threads take it.
#pragma once

#include "element_holder.h"

#include <pybind11/pybind11.h>

namespace kiv::python {

void bindErrors(pybind11::module_& module);
void bindMetamodel(pybind11::module_& module);
void bindModels(pybind11::module_& module);
void bindVersionControl(pybind11::module_& module);

}  // namespace kiv::python
