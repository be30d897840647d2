// How Python holds an element: the handle and a handle of its model. A C++ caller keeps
// its models alive itself; a Python caller holds elements and expects what they live in
// to stay, so every element that reaches Python keeps its model (a repository its
// repository model, a metamodel class its items) as long as Python holds it.
#pragma once

#include "qf/zero/core/model_impl.h"

#include <pybind11/pybind11.h>

#include <memory>

namespace kiv::python {

template <class T>
class ElementHolder {
 public:
  ElementHolder() = default;
  explicit ElementHolder(T* element) : element_(element), model_(modelOf(element)) {}
  T* get() const noexcept { return element_.get(); }

 private:
  static qf::zero::Model modelOf(const T* element) {
    if (element == nullptr || !*element) return qf::zero::Model();
    try {
      return element->getModel();
    } catch (...) {  // an element that is gone keeps nothing
      return qf::zero::Model();
    }
  }

  std::shared_ptr<T> element_;
  qf::zero::Model model_;
};

}  // namespace kiv::python

PYBIND11_DECLARE_HOLDER_TYPE(T, kiv::python::ElementHolder<T>)
