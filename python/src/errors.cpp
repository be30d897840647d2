// Catalog errors become Python exceptions: one class per catalog key, all deriving from
// kiv.Error. The classes are made by the Python package (kiv/errors.py); this side hands
// each raised error to its factory.
#include "binding.h"
#include "foundation/core/except/exception.h"
#include "kiv/messages/messages.h"
#include "qf/zero/core/messages.h"
#include "qf/zero/core/text.h"

#include <exception>
#include <string>
#include <variant>

namespace py = pybind11;

namespace kiv::python {

namespace {

namespace except = foundation::core::except;

// Set once at import, read by the translator; kept for the interpreter's lifetime.
py::object* errorFactory = nullptr;

py::object argumentOf(const except::MessageArgument& argument) {
  return std::visit(
      [](const auto& value) -> py::object {
        using T = std::decay_t<decltype(value)>;
        if constexpr (std::is_same_v<T, std::u16string>) {
          return py::str(qf::zero::toUtf8(value));
        } else if constexpr (std::is_same_v<T, std::string>) {
          return py::reinterpret_steal<py::object>(
              PyUnicode_DecodeUTF8(value.data(), value.size(), "replace"));
        } else {
          return py::int_(value);
        }
      },
      argument);
}

py::list keysOf(const except::Catalog& catalog) {
  py::list keys;
  for (const except::CatalogEntry& entry : catalog.entries()) keys.append(py::str(std::string(entry.key)));
  return keys;
}

void raise(const except::ExceptionBase& error) {
  const except::MessageId& id = error.GetBaseMsgIDObj();
  if (errorFactory == nullptr) {
    PyErr_SetString(PyExc_RuntimeError, error.message());
    return;
  }
  py::tuple arguments(id.arguments().size());
  for (std::size_t i = 0; i < id.arguments().size(); ++i) arguments[i] = argumentOf(id.arguments()[i]);
  const py::object text = py::reinterpret_steal<py::object>(PyUnicode_DecodeUTF8(
      error.message(), static_cast<Py_ssize_t>(std::char_traits<char>::length(error.message())), "replace"));
  const py::object exception = (*errorFactory)(id.catalogName(), id.key(), arguments, text);
  PyErr_SetObject(reinterpret_cast<PyObject*>(Py_TYPE(exception.ptr())), exception.ptr());
}

}  // namespace

void bindErrors(py::module_& module) {
  module.def("_catalogs", [] {
    py::dict catalogs;
    catalogs[py::str(std::string(qf0::messages::catalog().name()))] = keysOf(qf0::messages::catalog());
    catalogs[py::str(std::string(kiv::messages::catalog().name()))] = keysOf(kiv::messages::catalog());
    return catalogs;
  });
  module.def("_set_error_factory", [](py::object factory) {
    if (errorFactory == nullptr) errorFactory = new py::object();  // lives as long as the interpreter
    *errorFactory = std::move(factory);
  });
  py::register_exception_translator([](std::exception_ptr pending) {
    try {
      if (pending) std::rethrow_exception(pending);
    } catch (const except::ExceptionBase& error) {
      raise(error);
    }
  });
}

}  // namespace kiv::python
