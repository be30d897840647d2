#include "qf/zero/core/meta/framework_package.h"

#include "qf/zero/core/meta/meta_registry.h"
#include "qf/zero/core/model.h"

#include <boost/date_time/posix_time/posix_time.hpp>

#include <nlohmann/json.hpp>

#include <charconv>
#include <map>

namespace qf::zero {

namespace meta {

namespace {

// Value traits from a default value and a pair of text conversions.
template <class T>
class TypedTraits final : public ValueTraits {
 public:
  using Parse = std::optional<T> (*)(const std::string&);
  using Print = std::string (*)(const T&);
  TypedTraits(T zero, Parse parse, Print print) : zero_(std::move(zero)), parse_(parse), print_(print) {}

  const std::type_info& cppType() const noexcept override { return typeid(T); }
  Value defaultValue() const override { return Value::of(zero_); }
  std::optional<Value> parseText(std::u16string_view text) const override {
    if constexpr (std::is_same_v<T, std::u16string>) {
      return Value::of(std::u16string(text));
    } else if constexpr (std::is_same_v<T, Uuid>) {
      // Every reference and stored element id of a document is read here.
      std::optional<Uuid> parsed = parseUuid(text);
      if (!parsed) return std::nullopt;
      return Value::of(*parsed);
    } else {
      if (!parse_) return std::nullopt;
      std::optional<T> parsed = parse_(toUtf8(text));
      if (!parsed) return std::nullopt;
      return Value::of(std::move(*parsed));
    }
  }
  std::u16string toText(const Value& value) const override {
    if constexpr (std::is_same_v<T, std::u16string>) {
      return value.getValue<std::u16string>();
    } else {
      return print_ ? toUtf16(print_(value.getValue<T>())) : std::u16string();
    }
  }

 private:
  T zero_;
  Parse parse_;
  Print print_;
};

std::optional<bool> parseBoolean(const std::string& text) {
  if (text == "true") return true;
  if (text == "false") return false;
  return std::nullopt;
}

std::optional<int> parseInteger(const std::string& text) {
  int value = 0;
  auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), value);
  if (error != std::errc() || end != text.data() + text.size()) return std::nullopt;
  return value;
}

std::optional<DateTime> parseDateTime(const std::string& text) {
  try {
    DateTime time = boost::posix_time::from_iso_extended_string(text);
    if (time.is_special()) return std::nullopt;
    return time;
  } catch (const std::exception&) {
    return std::nullopt;
  }
}

std::optional<JsonValue> parseJson(const std::string& text) {
  JsonValue value = JsonValue::parse(text, nullptr, false);
  if (value.is_discarded()) return std::nullopt;
  return value;
}

struct FrameworkPackage {
  Model model = Model::create(nameBasedUuid(Uuid{}, "qf0:meta"));
  Package package;
  std::map<std::u16string, Class, std::less<>> classes;

  FrameworkPackage() {
    package = Package::create(model, id("package"), kFrameworkPackageUri, u"");
    primitive(u"String", std::make_shared<TypedTraits<std::u16string>>(std::u16string(), nullptr, nullptr));
    primitive(u"Boolean", std::make_shared<TypedTraits<bool>>(false, parseBoolean, [](const bool& v) {
                return std::string(v ? "true" : "false");
              }));
    primitive(u"Integer", std::make_shared<TypedTraits<int>>(0, parseInteger,
                                                             [](const int& v) { return std::to_string(v); }));
    primitive(u"UUID", std::make_shared<TypedTraits<Uuid>>(
                           Uuid{}, [](const std::string& t) { return parseUuid(t); },
                           [](const Uuid& v) { return toText(v); }));
    primitive(u"DateTime",
              std::make_shared<TypedTraits<DateTime>>(DateTime(), parseDateTime, [](const DateTime& v) {
                return boost::posix_time::to_iso_extended_string(v);
              }));
    primitive(u"JsonValue", std::make_shared<TypedTraits<JsonValue>>(
                                JsonValue(), parseJson, [](const JsonValue& v) { return v.dump(); }));
    primitive(u"HxArray", std::make_shared<TypedTraits<HxArray>>(HxArray(), nullptr, nullptr));
    for (const char16_t* name : {u"ModelElement", u"Model", u"NamedElement", u"Package", u"Type",
                                 u"PrimitiveType", u"StructuredType", u"Class", u"DataType", u"Enum",
                                 u"EnumLiteral", u"TypedElement", u"Property", u"Operation", u"Argument"}) {
      const bool isAbstract = std::u16string_view(name) != u"Model";
      Class metaClass = Class::create(model, id(toUtf8(name)), name, name, isAbstract);
      package->addType(metaClass);
      classes.emplace(name, metaClass);
    }
  }

  static Uuid id(const std::string& name) { return nameBasedUuid(nameBasedUuid(Uuid{}, "qf0:meta"), name); }

  void primitive(const char16_t* name, std::shared_ptr<const ValueTraits> traits) {
    package->addType(PrimitiveType::create(model, id(toUtf8(name)), name, name, std::move(traits)));
  }
};

FrameworkPackage& frameworkPackage() {
  static FrameworkPackage instance;
  return instance;
}

}  // namespace

Class frameworkMetaClass(std::u16string_view name) {
  const auto& classes = frameworkPackage().classes;
  auto it = classes.find(name);
  return it == classes.end() ? Class() : it->second;
}

MetaRegistry& MetaRegistry::getInstance() {
  static MetaRegistry instance;
  static const bool registered = [] {
    instance.registerRootPackage(frameworkPackage().package);
    return true;
  }();
  (void)registered;
  return instance;
}

}  // namespace meta

meta::Class ModelElement::metaClass() { return meta::frameworkMetaClass(u"ModelElement"); }
meta::Class Model::metaClass() { return meta::frameworkMetaClass(u"Model"); }

}  // namespace qf::zero
