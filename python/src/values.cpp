#include "values.h"

#include "collection_view.h"
#include "qf/zero/core/messages.h"
#include "qf/zero/core/meta/enum.h"
#include "qf/zero/core/meta/framework_package.h"
#include "qf/zero/core/meta/primitive_type.h"
#include "qf/zero/core/meta/structured_type.h"
#include "qf/zero/core/report_exception.h"
#include "qf/zero/core/text.h"

#include <boost/date_time/posix_time/posix_time.hpp>

#include <nlohmann/json.hpp>

#include <typeinfo>

namespace py = pybind11;
using qf::zero::Value;
namespace meta = qf::zero::meta;

namespace kiv::python {

namespace {

enum class Kind { String, Boolean, Integer, Uuid, DateTime, Json, Literal, Element, Text, Opaque };

Kind kindOf(const meta::Property& property) {
  const meta::Type type = property->getType();
  const qf::zero::ModelElement element(type);
  if (qf::zero::elementCast<meta::Class>(element)) return Kind::Element;
  if (qf::zero::elementCast<meta::Enum>(element)) return Kind::Literal;
  const auto primitive = qf::zero::elementCast<meta::PrimitiveType>(element);
  if (!primitive || !primitive->getTraits()) return Kind::Opaque;
  const std::type_info& held = primitive->getTraits()->cppType();
  if (held == typeid(std::u16string)) return Kind::String;
  if (held == typeid(bool)) return Kind::Boolean;
  if (held == typeid(int)) return Kind::Integer;
  if (held == typeid(qf::zero::Uuid)) return Kind::Uuid;
  if (held == typeid(qf::zero::DateTime)) return Kind::DateTime;
  if (held == typeid(qf::zero::JsonValue)) return Kind::Json;
  return Kind::Text;
}

meta::PrimitiveType primitiveOf(const meta::Property& property) {
  return qf::zero::elementCast<meta::PrimitiveType>(qf::zero::ModelElement(property->getType()));
}

[[noreturn]] void wrongType(const meta::Property& property, const py::handle& object, const char* expected) {
  throw py::type_error("property '" + qf::zero::toUtf8(property->getName()) + "' takes " + expected +
                       ", not " + std::string(py::str(py::type::of(object).attr("__name__"))));
}

py::object dateTimeToPython(const qf::zero::DateTime& time) {
  if (time.is_special()) return py::none();
  const auto date = time.date();
  const auto day = time.time_of_day();
  const long micros = static_cast<long>(day.fractional_seconds() * 1000000 / day.ticks_per_second());
  return py::module_::import("datetime")
      .attr("datetime")(static_cast<int>(date.year()), static_cast<int>(date.month()),
                        static_cast<int>(date.day()), day.hours(), day.minutes(), day.seconds(), micros);
}

qf::zero::DateTime dateTimeFromPython(const py::handle& object) {
  const py::object datetime = py::module_::import("datetime").attr("datetime");
  if (!py::isinstance(object, datetime)) throw py::type_error("a DateTime takes a datetime.datetime");
  py::object utc = py::reinterpret_borrow<py::object>(object);
  if (!utc.attr("tzinfo").is_none()) {
    utc = utc.attr("astimezone")(py::module_::import("datetime").attr("timezone").attr("utc"));
  }
  const boost::gregorian::date date(utc.attr("year").cast<int>(), utc.attr("month").cast<int>(),
                                    utc.attr("day").cast<int>());
  const boost::posix_time::time_duration day =
      boost::posix_time::hours(utc.attr("hour").cast<int>()) +
      boost::posix_time::minutes(utc.attr("minute").cast<int>()) +
      boost::posix_time::seconds(utc.attr("second").cast<int>()) +
      boost::posix_time::microseconds(utc.attr("microsecond").cast<int>());
  return qf::zero::DateTime(date, day);
}

}  // namespace

py::object uuidToPython(const qf::zero::Uuid& id) {
  return py::module_::import("uuid").attr("UUID")(
      py::arg("bytes") = py::bytes(reinterpret_cast<const char*>(id.data), id.size()));
}

qf::zero::Uuid uuidFromPython(const py::handle& object) {
  py::object id = py::reinterpret_borrow<py::object>(object);
  if (py::isinstance<py::str>(object)) id = py::module_::import("uuid").attr("UUID")(object);
  if (!py::isinstance(id, py::module_::import("uuid").attr("UUID")))
    throw py::type_error("expected a uuid.UUID");
  const std::string bytes = id.attr("bytes").cast<std::string>();
  qf::zero::Uuid uuid{};
  std::copy(bytes.begin(), bytes.end(), uuid.data);
  return uuid;
}

py::object jsonToPython(const qf::zero::JsonValue& json) {
  return py::module_::import("json").attr("loads")(json.dump());
}

qf::zero::JsonValue jsonFromPython(const py::handle& object) {
  const std::string text = py::module_::import("json").attr("dumps")(object).cast<std::string>();
  return qf::zero::JsonValue::parse(text);
}

py::object toPython(const Value& value, const meta::Property& property) {
  if (value.isEmpty()) return py::none();
  switch (kindOf(property)) {
    case Kind::String:
      return py::str(qf::zero::toUtf8(value.getValue<std::u16string>()));
    case Kind::Boolean:
      return py::bool_(value.getValue<bool>());
    case Kind::Integer:
      return py::int_(value.getValue<int>());
    case Kind::Uuid:
      return uuidToPython(value.getValue<qf::zero::Uuid>());
    case Kind::DateTime:
      return dateTimeToPython(value.getValue<qf::zero::DateTime>());
    case Kind::Json:
      return jsonToPython(value.getValue<qf::zero::JsonValue>());
    case Kind::Literal: {
      const auto literal = qf::zero::elementCast<meta::EnumLiteral>(value.getElement());
      return literal ? py::object(py::str(qf::zero::toUtf8(literal.getName()))) : py::object(py::none());
    }
    case Kind::Element:
      return value.getElement() ? py::cast(value.getElement()) : py::none();
    case Kind::Text:
      return py::str(qf::zero::toUtf8(primitiveOf(property)->getTraits()->toText(value)));
    case Kind::Opaque:
      break;
  }
  throw py::type_error("property '" + qf::zero::toUtf8(property->getName()) +
                       "' holds values Python cannot read");
}

Value fromPython(const py::handle& object, const meta::Property& property) {
  if (object.is_none()) return Value();
  switch (kindOf(property)) {
    case Kind::String:
      if (!py::isinstance<py::str>(object)) wrongType(property, object, "a str");
      return Value::createPrimitiveValue(property, qf::zero::toUtf16(object.cast<std::string>()));
    case Kind::Boolean:
      if (!py::isinstance<py::bool_>(object)) wrongType(property, object, "a bool");
      return Value::createPrimitiveValue(property, object.cast<bool>());
    case Kind::Integer: {
      if (!py::isinstance<py::int_>(object) || py::isinstance<py::bool_>(object))
        wrongType(property, object, "an int");
      const long long number = object.cast<long long>();
      if (number < std::numeric_limits<int>::min() || number > std::numeric_limits<int>::max())
        throw py::value_error("property '" + qf::zero::toUtf8(property->getName()) + "' takes a 32-bit int");
      return Value::createPrimitiveValue(property, static_cast<int>(number));
    }
    case Kind::Uuid:
      return Value::createPrimitiveValue(property, uuidFromPython(object));
    case Kind::DateTime:
      return Value::createPrimitiveValue(property, dateTimeFromPython(object));
    case Kind::Json:
      return Value::createPrimitiveValue(property, jsonFromPython(object));
    case Kind::Literal: {
      if (!py::isinstance<py::str>(object)) wrongType(property, object, "a literal's name (str)");
      const auto enumeration = qf::zero::elementCast<meta::Enum>(qf::zero::ModelElement(property->getType()));
      const meta::EnumLiteral literal =
          enumeration->findLiteral(qf::zero::toUtf16(object.cast<std::string>()));
      if (!literal) qf::zero::reportException(qf0::messages::InvalidValue());
      return Value::createElementValue(literal, property);
    }
    case Kind::Element:
      if (!py::isinstance<qf::zero::ModelElement>(object)) wrongType(property, object, "an Element");
      return Value::createElementValue(object.cast<qf::zero::ModelElement>(), property);
    case Kind::Text: {
      if (!py::isinstance<py::str>(object)) wrongType(property, object, "its text (str)");
      const std::optional<Value> parsed =
          primitiveOf(property)->getTraits()->parseText(qf::zero::toUtf16(object.cast<std::string>()));
      if (!parsed) qf::zero::reportException(qf0::messages::InvalidValue());
      return *parsed;
    }
    case Kind::Opaque:
      break;
  }
  throw py::type_error("property '" + qf::zero::toUtf8(property->getName()) +
                       "' holds values Python cannot set");
}

meta::Property propertyNamed(const qf::zero::ModelElement& element, const std::string& name) {
  const meta::Class metaClass = element.getMetaClass();
  const meta::Property property = metaClass->findProperty(qf::zero::toUtf16(name));
  if (!property) {
    qf::zero::reportException(
        qf0::messages::NoSuchProperty(metaClass.getQualifiedName(), qf::zero::toUtf16(name)));
  }
  return property;
}

py::object readProperty(const qf::zero::ModelElement& element, const meta::Property& property) {
  if (property->isMany()) return py::cast(CollectionView(element, property));
  return toPython(element.getPropertyValue(property), property);
}

void writeProperty(qf::zero::ModelElement element, const meta::Property& property, const py::handle& object) {
  if (!property->isMany()) {
    element.setPropertyValue(property, fromPython(object, property));
    return;
  }
  if (py::isinstance<py::str>(object) || !py::isinstance<py::iterable>(object))
    throw py::type_error("property '" + qf::zero::toUtf8(property->getName()) +
                         "' takes an iterable of items");
  std::vector<Value> items;
  for (const py::handle item : object) items.push_back(fromPython(item, property));
  CollectionView view(element, property);
  view.replace(items);
}

}  // namespace kiv::python
