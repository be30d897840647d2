// Models, elements, their properties and transactions.
#include "binding.h"
#include "collection_view.h"
#include "qf/zero/core/meta/meta_registry.h"
#include "qf/zero/core/meta/structured_type.h"
#include "qf/zero/core/model_impl.h"
#include "qf/zero/core/query.h"
#include "qf/zero/core/text.h"
#include "qf/zero/core/transaction.h"
#include "qf/zero/io/json_parser.h"
#include "qf/zero/io/json_serializer.h"
#include "qf/zero/io/serialization_output.h"
#include "values.h"

#include <nlohmann/json.hpp>

#include <pybind11/stl.h>

#include <optional>
#include <string>

namespace py = pybind11;
namespace meta = qf::zero::meta;
using qf::zero::Model;
using qf::zero::ModelElement;
using qf::zero::toUtf16;
using qf::zero::toUtf8;

namespace kiv::python {

namespace {

// A transaction as a Python object: `with model.transaction():` commits at the end of the
// block and cancels when the block raises; left open, it is cancelled when collected.
class PyTransaction {
 public:
  explicit PyTransaction(const Model& model) : model_(model) {}

  PyTransaction& enter() {
    if (transaction_.isOpen()) throw py::value_error("this transaction is already open");
    transaction_ = model_->beginTransaction();
    return *this;
  }
  void exit(const py::object& error) {
    if (!transaction_.isOpen()) return;  // committed or cancelled inside the block
    if (error.is_none()) {
      transaction_.commit();
    } else {
      transaction_.cancel();
    }
  }
  void commit() { transaction_.commit(); }
  void cancel() { transaction_.cancel(); }
  bool isOpen() const { return transaction_.isOpen(); }

 private:
  Model model_;
  qf::zero::Transaction transaction_;
};

meta::Class classOf(const py::handle& type) {
  if (py::isinstance<py::str>(type))
    return meta::MetaRegistry::getInstance().getClass(toUtf16(type.cast<std::string>()));
  return type.cast<meta::Class>();
}

std::string repr(const ModelElement& element) {
  if (!element) return "<Element null>";
  return "<" + toUtf8(element.getMetaClass().getQualifiedName()) + " " + element.identifier() + ">";
}

}  // namespace

void bindModels(py::module_& module) {
  py::class_<PyTransaction>(module, "Transaction")
      .def("__enter__", &PyTransaction::enter, py::return_value_policy::reference_internal)
      .def("__exit__",
           [](PyTransaction& t, const py::object& type, const py::object&, const py::object&) {
             t.exit(type);
             return false;
           })
      .def("commit", &PyTransaction::commit)
      .def("cancel", &PyTransaction::cancel)
      .def_property_readonly("is_open", &PyTransaction::isOpen);

  py::class_<Model>(module, "Model")
      .def(py::init([] { return Model::create(); }))
      .def(
          "transaction", [](const Model& model) { return PyTransaction(model); },
          "A transaction to use in a `with` block: it begins on entry.")
      .def(
          "create",
          [](const Model& model, const py::object& type, const std::optional<py::object>& id) {
            return classOf(type).instantiate(model, id ? uuidFromPython(*id) : qf::zero::Uuid{});
          },
          py::arg("type"), py::arg("uuid") = std::nullopt,
          "A new element of the class (a MetaClass or its qualified name); inside a transaction.")
      .def("find",
           [](const Model& model, const py::object& id) -> py::object {
             const ModelElement found = model->findElement(uuidFromPython(id));
             return found ? py::cast(found) : py::none();
           })
      .def_property_readonly("elements", [](const Model& model) { return model->getTopLevelElements(); })
      .def_property_readonly("element_count", [](const Model& model) { return model->getElementCount(); })
      .def(
          "instances",
          [](const Model& model, const py::object& type, bool subclasses) {
            return model->getInstances(classOf(type),
                                       subclasses ? qf::zero::query::SearchClassMatchMode::IncludeSubclasses
                                                  : qf::zero::query::SearchClassMatchMode::ExactClass);
          },
          py::arg("type"), py::arg("subclasses") = true, "Live instances of the class, in creation order.")
      .def("to_json",
           [](const Model& model) {
             nlohmann::ordered_json document;
             qf::zero::io::JSONSerializer().serialize(
                 model, qf::zero::io::SerializationOutput::forIntermediateFormat(&document));
             return jsonToPython(document);
           })
      .def("load_json",
           [](const Model& model, const py::object& document) {
             const qf::zero::JsonValue json = jsonFromPython(document);
             qf::zero::Transaction transaction = model->beginTransaction();
             qf::zero::io::JSONParser().parseVerbatim(json, model);
             transaction.commit();
           })
      .def("__eq__", [](const Model& a, const Model& b) { return a == b; })
      .def("__hash__", [](const Model& m) { return std::hash<const void*>()(m.getImpl()); });

  py::class_<ModelElement, ElementHolder<ModelElement>>(module, "Element")
      .def_property_readonly("uuid", [](const ModelElement& e) { return uuidToPython(e.getUuid()); })
      .def_property_readonly("type", [](const ModelElement& e) { return e.getMetaClass(); })
      .def_property_readonly("model", [](const ModelElement& e) { return e.getModel(); })
      .def_property_readonly("container",
                             [](const ModelElement& e) -> py::object {
                               const ModelElement container = e.container();
                               return container ? py::cast(container) : py::none();
                             })
      .def_property_readonly("is_live", [](const ModelElement& e) { return e.isLive(); })
      .def("destroy", [](ModelElement& e) { e.destroy(); })
      .def("get", [](const ModelElement& e,
                     const std::string& name) { return readProperty(e, propertyNamed(e, name)); })
      .def("set", [](const ModelElement& e, const std::string& name,
                     const py::object& value) { writeProperty(e, propertyNamed(e, name), value); })
      .def("__getitem__", [](const ModelElement& e,
                             const std::string& name) { return readProperty(e, propertyNamed(e, name)); })
      .def("__setitem__", [](const ModelElement& e, const std::string& name,
                             const py::object& value) { writeProperty(e, propertyNamed(e, name), value); })
      .def("__getattr__",
           [](const ModelElement& e, const std::string& name) {
             const meta::Property property =
                 e ? e.getMetaClass()->findProperty(toUtf16(name)) : meta::Property();
             if (!property) throw py::attribute_error(name);
             return readProperty(e, property);
           })
      .def("__setattr__",
           [](py::object self, const std::string& name, const py::object& value) {
             const ModelElement& e = self.cast<const ModelElement&>();
             const meta::Property property =
                 e ? e.getMetaClass()->findProperty(toUtf16(name)) : meta::Property();
             if (!property)
               throw py::attribute_error("'" + toUtf8(e.getMetaClass().getQualifiedName()) +
                                         "' has no property '" + name + "'");
             writeProperty(e, property, value);
           })
      .def("__eq__",
           [](const ModelElement& a, const py::object& b) {
             return py::isinstance<ModelElement>(b) && a == b.cast<ModelElement>();
           })
      .def("__hash__", [](const ModelElement& e) { return std::hash<const void*>()(e.getImpl()); })
      .def("__bool__", [](const ModelElement& e) { return static_cast<bool>(e); })
      .def("__repr__", &repr);

  py::class_<CollectionView>(module, "Collection")
      .def("__len__", &CollectionView::size)
      .def("__getitem__",
           [](const CollectionView& c, const py::object& at) -> py::object {
             if (c.isMap() && !py::isinstance<py::int_>(at)) {
               py::object found = c.find(at);
               if (found.is_none()) throw py::key_error(py::str(at));
               return found;
             }
             return c.at(at.cast<std::ptrdiff_t>());
           })
      .def("__delitem__", &CollectionView::removeAt)
      .def("__iter__", [](const CollectionView& c) { return py::iter(c.items()); })
      .def("__contains__", &CollectionView::contains)
      .def("__eq__",
           [](const CollectionView& c, const py::object& other) {
             if (py::isinstance<CollectionView>(other))
               return c.items().equal(other.cast<const CollectionView&>().items());
             if (py::isinstance<py::set>(other) || py::isinstance<py::frozenset>(other))
               return py::set(c.items()).equal(other);
             return c.items().equal(other);
           })
      .def("__repr__",
           [](const CollectionView& c) { return "Collection(" + std::string(py::repr(c.items())) + ")"; })
      .def("add", &CollectionView::add, "Adds an item: at the end of a sequence.")
      .def("append", &CollectionView::add)
      .def("insert", &CollectionView::insert)
      .def("remove", &CollectionView::remove)
      .def("clear", &CollectionView::clear)
      .def("get", [](const CollectionView& c, const py::object& key) { return c.find(key); })
      .def("to_list", &CollectionView::items);
}

}  // namespace kiv::python
