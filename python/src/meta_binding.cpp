// Metamodels made at run time: a package of enumerations and classes with their
// properties, registered so that documents and change reports can name its classes. The
// Python package's Metamodel builder and description loader sit on these calls.
#include "binding.h"
#include "qf/zero/core/meta/enum.h"
#include "qf/zero/core/meta/meta_registry.h"
#include "qf/zero/core/meta/package.h"
#include "qf/zero/core/meta/primitive_type.h"
#include "qf/zero/core/meta/structured_type.h"
#include "qf/zero/core/model_impl.h"
#include "qf/zero/core/text.h"

#include <pybind11/stl.h>

#include <string>
#include <utility>
#include <vector>

namespace py = pybind11;
namespace meta = qf::zero::meta;
using qf::zero::toUtf16;
using qf::zero::toUtf8;

namespace kiv::python {

namespace {

const char* kindName(meta::ValueFlags flags) {
  switch (flags) {
    case meta::ValueFlags::Optional:
      return "optional";
    case meta::ValueFlags::Single:
      return "single";
    case meta::ValueFlags::Sequence:
      return "sequence";
    case meta::ValueFlags::Set:
      return "set";
    case meta::ValueFlags::Map:
      return "map";
  }
  return "single";
}

meta::ValueFlags kindNamed(const std::string& kind) {
  if (kind == "optional") return meta::ValueFlags::Optional;
  if (kind == "single") return meta::ValueFlags::Single;
  if (kind == "sequence") return meta::ValueFlags::Sequence;
  if (kind == "set") return meta::ValueFlags::Set;
  if (kind == "map") return meta::ValueFlags::Map;
  throw py::value_error("a property's kind is one of single, optional, sequence, set, map; not '" + kind +
                        "'");
}

// A package under construction: it owns the model that holds its items.
class MetaPackage {
 public:
  MetaPackage(const std::string& uri, const std::string& name)
      : package_(meta::Package::create(items_, {}, toUtf16(uri), toUtf16(name))), name_(name) {}

  meta::Enum addEnum(const std::string& name, const std::vector<std::pair<std::string, int>>& literals) {
    meta::Enum enumeration = meta::Enum::create(items_, {}, toUtf16(name), toUtf16(name_ + "." + name));
    for (const auto& [literal, value] : literals)
      enumeration->addLiteral(meta::EnumLiteral::create(items_, {}, toUtf16(literal), value));
    package_->addType(enumeration);
    return enumeration;
  }

  meta::Class addClass(const std::string& name, bool isAbstract) {
    meta::Class made =
        meta::Class::create(items_, {}, toUtf16(name), toUtf16(name_ + "." + name), isAbstract);
    made->setSuperclass(qf::zero::ModelElement::metaClass());
    package_->addType(made);
    return made;
  }

  // `type`: a primitive type's name, or a class or enumeration of a registered or this package.
  meta::Property addProperty(const meta::Class& owner, const std::string& name, const std::string& kind,
                             const py::object& type, bool composite, int index, bool ordered, bool unique,
                             const std::optional<std::string>& defaultText) {
    const meta::ValueFlags flags = kindNamed(kind);
    meta::Property property = meta::Property::create(items_, {}, toUtf16(name), flags, composite);
    property->setType(typeOf(type));
    property->setPropertyIndex(index);
    const bool many = flags == meta::ValueFlags::Sequence || flags == meta::ValueFlags::Set ||
                      flags == meta::ValueFlags::Map;
    property->setLower(many || flags == meta::ValueFlags::Optional ? 0 : 1);
    property->setUpper(many ? -1 : 1);
    property->setIsOrdered(ordered);
    property->setIsUnique(unique);
    if (defaultText) property->setDefaultValue(toUtf16(*defaultText));
    owner->addProperty(property);
    return property;
  }

  void registerPackage() { meta::MetaRegistry::getInstance().registerRootPackage(package_); }
  std::string uri() const { return toUtf8(package_->getUri()); }

 private:
  static meta::Type typeOf(const py::object& type) {
    if (py::isinstance<meta::Class>(type)) return type.cast<meta::Class>();
    if (py::isinstance<meta::Enum>(type)) return type.cast<meta::Enum>();
    if (!py::isinstance<py::str>(type))
      throw py::type_error("a property's type is a type name, a class or an enum");
    const std::u16string name = toUtf16(type.cast<std::string>());
    const auto& registry = meta::MetaRegistry::getInstance();
    if (const meta::PrimitiveType primitive = registry.getPrimitiveType(name)) return primitive;
    return registry.getType(name);  // raises "NoSuchType"
  }

  qf::zero::Model items_ = qf::zero::Model::create();
  meta::Package package_;
  std::string name_;
};

std::string nameOf(const meta::NamedElement& item) { return toUtf8(item.getName()); }

}  // namespace

void bindMetamodel(py::module_& module) {
  py::class_<meta::Enum, ElementHolder<meta::Enum>>(module, "MetaEnum")
      .def_property_readonly("name", [](const meta::Enum& e) { return nameOf(e); })
      .def_property_readonly("qualified_name",
                             [](const meta::Enum& e) { return toUtf8(e.getQualifiedName()); })
      .def_property_readonly("literals", [](const meta::Enum& e) {
        std::vector<std::string> names;
        for (const meta::EnumLiteral& literal : e->getLiterals()) names.push_back(nameOf(literal));
        return names;
      });

  py::class_<meta::Property, ElementHolder<meta::Property>>(module, "MetaProperty")
      .def_property_readonly("name", [](const meta::Property& p) { return nameOf(p); })
      .def_property_readonly("kind", [](const meta::Property& p) { return kindName(p->getValueFlags()); })
      .def_property_readonly("type_name",
                             [](const meta::Property& p) { return toUtf8(p->getType().getQualifiedName()); })
      .def_property_readonly("is_many", [](const meta::Property& p) { return p->isMany(); })
      .def_property_readonly("is_reference", [](const meta::Property& p) { return p->isReference(); })
      .def_property_readonly("is_containment", [](const meta::Property& p) { return p->isContainment(); })
      .def("set_opposite",
           [](const meta::Property& p, const meta::Property& other) { p->setOpposite(other); })
      .def("set_key", [](const meta::Property& p, const meta::Property& key) { p->setQualifiedBy(key); })
      .def("__repr__",
           [](const meta::Property& p) { return "<MetaProperty " + toUtf8(p.getQualifiedName()) + ">"; });

  py::class_<meta::Class, ElementHolder<meta::Class>>(module, "MetaClass")
      .def_property_readonly("name", [](const meta::Class& c) { return nameOf(c); })
      .def_property_readonly("qualified_name",
                             [](const meta::Class& c) { return toUtf8(c.getQualifiedName()); })
      .def_property_readonly("is_abstract", [](const meta::Class& c) { return c->isAbstract(); })
      .def_property_readonly("properties", [](const meta::Class& c) { return c->getAllProperties(); })
      .def_property_readonly("superclass",
                             [](const meta::Class& c) {
                               const auto& supers = c->getSuperclasses();
                               return supers.empty() ? meta::Class() : supers.front();
                             })
      .def("set_superclass",
           [](const meta::Class& c, const meta::Class& superclass) { c->setSuperclass(superclass); })
      .def("property",
           [](const meta::Class& c, const std::string& name) {
             const meta::Property found = c->findProperty(toUtf16(name));
             if (!found) throw py::key_error(name);
             return found;
           })
      .def("is_subclass_of",
           [](const meta::Class& c, const meta::Class& other) { return c->isSubclassOf(other); })
      .def("__eq__", [](const meta::Class& a, const meta::Class& b) { return a == b; })
      .def("__hash__", [](const meta::Class& c) { return std::hash<const void*>()(c.getImpl()); })
      .def("__repr__",
           [](const meta::Class& c) { return "<MetaClass " + toUtf8(c.getQualifiedName()) + ">"; });

  py::class_<MetaPackage>(module, "MetaPackage")
      .def(py::init<const std::string&, const std::string&>(), py::arg("uri"), py::arg("name"))
      .def_property_readonly("uri", &MetaPackage::uri)
      .def("add_enum", &MetaPackage::addEnum, py::arg("name"), py::arg("literals"))
      .def("add_class", &MetaPackage::addClass, py::arg("name"), py::arg("abstract") = false)
      .def("add_property", &MetaPackage::addProperty, py::arg("owner"), py::arg("name"), py::arg("kind"),
           py::arg("type"), py::arg("composite"), py::arg("index"), py::arg("ordered"), py::arg("unique"),
           py::arg("default") = std::nullopt)
      .def("register", &MetaPackage::registerPackage);

  module.def(
      "meta_class",
      [](const std::string& qualifiedName) {
        return meta::MetaRegistry::getInstance().getClass(toUtf16(qualifiedName));
      },
      py::arg("qualified_name"), "The registered class of that qualified name; raises NoSuchType.");
}

}  // namespace kiv::python
