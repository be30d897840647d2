// The module `kiv._kiv`: importing it initialises kiv's metamodel package once; the
// interpreter's exit tears it down.
#include "binding.h"
#include "kiv/host_entry.h"

namespace py = pybind11;

PYBIND11_MODULE(_kiv, module) {
  module.doc() = "kiv: version control for in-memory object models (the compiled part)";
  HXInitialize_kiv();
  kiv::python::bindErrors(module);
  kiv::python::bindMetamodel(module);
  kiv::python::bindModels(module);
  kiv::python::bindVersionControl(module);
  py::module_::import("atexit").attr("register")(py::cpp_function([] { HXTerminate_kiv(); }));
}
