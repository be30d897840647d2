#include "qf/zero/io/json_parser.h"

#include "attribute_codec.h"
#include "qf/zero/core/internal/flat_table.h"
#include "qf/zero/core/meta/enum.h"
#include "qf/zero/core/meta/framework_package.h"
#include "qf/zero/core/model_impl.h"
#include "qf/zero/core/text.h"
#include "qf/zero/io/json_constants.h"

#include <nlohmann/json.hpp>

#include <limits>
#include <unordered_map>
#include <unordered_set>

namespace qf::zero::io {

using nlohmann::ordered_json;
namespace msg = qf0::messages;

namespace {

[[noreturn]] void malformed(std::string what) { reportException(msg::MalformedDocument(std::move(what))); }

[[noreturn]] void wrongType(const meta::Property& property, std::string expected, const ordered_json& found) {
  reportException(
      msg::WrongJsonType(property.getQualifiedName(), std::move(expected), internal::describeJson(found)));
}

std::string entryLabel(std::size_t index) { return "entry " + std::to_string(index); }

}  // namespace

// One parse: the entries read so far, and what was learnt of their classes.
class JSONParser::Run {
 public:
  Run(ParseCustomizer& customizer, ModelBuilder& builder, Model model)
      : customizer_(customizer), builder_(builder), model_(std::move(model)) {}

  std::vector<ParseItem> parse(const std::vector<const ordered_json*>& entries) {
    entries_.reserve(entries.size());
    byUuid_.reserve(entries.size());
    for (std::size_t i = 0; i < entries.size(); ++i) instantiate(*entries[i], i);
    for (Entry& entry : entries_) readAttributes(entry);
    for (Entry& entry : entries_) releaseChildren(entry);
    for (Entry& entry : entries_) readReferences(entry);
    std::vector<ParseItem> items;
    items.reserve(entries_.size());
    for (const Entry& entry : entries_) items.emplace_back(Value::createElementValue(entry.element));
    return items;
  }

 private:
  struct Entry {
    std::size_t index;
    ModelElement element;
    meta::Class metaClass;
    const ordered_json* content;
  };
  struct PropertyPlan {
    meta::Property property;
    internal::AttributeCodec codec;
  };

  void instantiate(const ordered_json& json, std::size_t index) {
    if (!json.is_object()) malformed(entryLabel(index) + " is not an object");
    const auto type = json.find(JSONConstants::TYPE_ATTR);
    if (type == json.end() || !type->is_string()) malformed(entryLabel(index) + " has no type name");
    const meta::Class metaClass = classNamed(type->get_ref<const std::string&>());

    ElementId id;
    if (const auto idJson = json.find(JSONConstants::ID_ATTR); idJson != json.end() && !idJson->is_null()) {
      id.uuid = readUuid(*idJson, [&] { return entryLabel(index); });
      if (byUuid_.find(*id.uuid) != nullptr || skipped_.count(*id.uuid) != 0)
        reportException(msg::DuplicateElementId(toText(*id.uuid)));
    }
    const ordered_json* content = nullptr;
    if (const auto c = json.find(JSONConstants::CONTENT_ATTR); c != json.end() && !c->is_null()) {
      if (!c->is_object()) malformed(entryLabel(index) + " has a content that is not an object");
      content = &*c;
    }
    if (!customizer_.shallInstantiate(metaClass, id)) {
      if (id.uuid) skipped_.insert(*id.uuid);
      return;
    }
    ModelElement element = builder_.instantiate(model_, metaClass, id);
    if (!element) return;
    byUuid_.insertOrAssign(element.getUuid(), element);
    entries_.push_back(Entry{index, std::move(element), metaClass, content});
  }

  // `where` names the place for the error only: it is not called for a good UUID, which is
  // nearly every time, and saying where costs strings.
  template <class Where>
  static Uuid readUuid(const ordered_json& json, const Where& where) {
    if (json.is_string()) {
      if (auto uuid = parseUuid(json.get_ref<const std::string&>())) return *uuid;
    }
    malformed(where() + ": " + json.dump() + " is not a UUID");
  }

  // The class of a type name, asked of the customizer once per name and parse.
  meta::Class classNamed(const std::string& name) {
    if (auto it = classes_.find(name); it != classes_.end()) return it->second;
    const std::u16string typeName = toUtf16(name);
    const meta::Class metaClass = customizer_.getMetaClass(typeName);
    if (!metaClass) reportException(msg::NoSuchClass(typeName));
    return classes_.emplace(name, metaClass).first->second;
  }

  const PropertyPlan& planFor(const Entry& entry, const std::string& member) {
    auto& members = plans_[entry.metaClass.getImpl()];
    if (auto it = members.find(member); it != members.end()) return it->second;
    const meta::Property property = customizer_.getMetaProperty(entry.metaClass, toUtf16(member));
    if (!property) reportException(msg::NoSuchProperty(entry.metaClass.getQualifiedName(), toUtf16(member)));
    PropertyPlan plan{property, {}};
    if (!property->isReference()) plan.codec = internal::codecFor(property->getType());
    return members.emplace(member, std::move(plan)).first->second;
  }

  void readAttributes(Entry& entry) {
    if (entry.content == nullptr) return;
    for (const auto& [member, json] : entry.content->items()) {
      const PropertyPlan& plan = planFor(entry, member);
      if (plan.property->isReference() || plan.codec.kind == internal::AttributeKind::Opaque) continue;
      if (!customizer_.shallReadProperty(entry.element, plan.property)) continue;
      if (plan.property->isMany()) {
        if (!json.is_array()) wrongType(plan.property, "an array", json);
        builder_.clearObjectValue(entry.element, plan.property);
        for (const ordered_json& item : json) {
          builder_.setObjectValue(entry.element, plan.property,
                                  readAttribute(plan.property, plan.codec, item));
        }
      } else if (plan.codec.kind == internal::AttributeKind::Json && !json.is_null()) {
        builder_.setJsonValue(entry.element, plan.property, json);
      } else {
        builder_.setValue(entry.element, plan.property, readAttribute(plan.property, plan.codec, json));
      }
    }
  }

  Value readAttribute(const meta::Property& property, const internal::AttributeCodec& codec,
                      const ordered_json& json) {
    if (json.is_null()) {
      // A JSON value of a single-valued property may be null itself; an optional one
      // reads null as absent.
      if (property->isOptional()) return builder_.createEmptyOptionalValue(property);
      if (codec.kind != internal::AttributeKind::Json) wrongType(property, "a value", json);
    }
    switch (codec.kind) {
      case internal::AttributeKind::String:
        if (!json.is_string()) wrongType(property, "a string", json);
        return Value::createPrimitiveValue(property, toUtf16(json.get_ref<const std::string&>()));
      case internal::AttributeKind::Boolean:
        if (!json.is_boolean()) wrongType(property, "a boolean", json);
        return Value::createPrimitiveValue(property, json.get<bool>());
      case internal::AttributeKind::Integer: {
        if (!json.is_number_integer()) wrongType(property, "an integer", json);
        const bool fits =
            json.is_number_unsigned()
                ? json.get<std::uint64_t>() <= static_cast<std::uint64_t>(std::numeric_limits<int>::max())
                : json.get<std::int64_t>() >= std::numeric_limits<int>::min() &&
                      json.get<std::int64_t>() <= std::numeric_limits<int>::max();
        if (!fits) wrongType(property, "a 32-bit integer", json);
        return Value::createPrimitiveValue(property, json.get<int>());
      }
      case internal::AttributeKind::Json:
        return Value::createPrimitiveValue(property, JsonValue(json));
      case internal::AttributeKind::Text: {
        if (!json.is_string()) wrongType(property, "a string", json);
        Value value = customizer_.parsePrimitiveValue(property, toUtf16(json.get_ref<const std::string&>()));
        if (value.isEmpty()) wrongType(property, "a " + toUtf8(property->getType().getQualifiedName()), json);
        return value;
      }
      case internal::AttributeKind::Literal: {
        const auto metaEnum = elementCast<meta::Enum>(ModelElement(property->getType()));
        meta::EnumLiteral literal;
        if (json.is_string()) literal = metaEnum->findLiteral(toUtf16(json.get_ref<const std::string&>()));
        if (!literal) wrongType(property, "a literal of " + toUtf8(metaEnum.getQualifiedName()), json);
        return Value::createElementValue(literal, property);
      }
      case internal::AttributeKind::Registered:
        return codec.serializer->fromJson(json, property);
      case internal::AttributeKind::Datatype:
        return readDatatype(property, codec, json);
      case internal::AttributeKind::Opaque:
        break;
    }
    return Value();
  }

  Value readDatatype(const meta::Property& property, const internal::AttributeCodec& codec,
                     const ordered_json& json) {
    if (!json.is_object()) wrongType(property, "an object", json);
    const auto datatype = elementCast<meta::DataType>(ModelElement(property->getType()));
    Value datum = builder_.instantiateDataType(datatype);
    for (const auto& [member, memberJson] : json.items()) {
      const meta::Property memberProperty = customizer_.getMetaProperty(datatype, toUtf16(member));
      if (!memberProperty) reportException(msg::NoSuchProperty(datatype.getQualifiedName(), toUtf16(member)));
      const internal::AttributeCodec memberCodec = internal::codecFor(memberProperty->getType());
      if (memberCodec.kind == internal::AttributeKind::Opaque) continue;
      datum = codec.datatype->setPropertyValue(datum, memberProperty,
                                               readAttribute(memberProperty, memberCodec, memberJson));
    }
    return datum;
  }

  // Children that the document places anew are let go first, so that containment can be
  // rebuilt in any entry order: with every written containment empty, each link made
  // while references are read is one the document asks for, and only a document that
  // is circular itself can make a circle.
  void releaseChildren(Entry& entry) {
    if (entry.content == nullptr) return;
    for (const auto& [member, json] : entry.content->items()) {
      const meta::Property& property = planFor(entry, member).property;
      if (!property->isContainment() || !customizer_.shallReadProperty(entry.element, property)) continue;
      if (property->isMany()) {
        builder_.clearObjectValue(entry.element, property);
      } else {
        builder_.setValue(entry.element, property, builder_.createEmptyOptionalValue(property));
      }
    }
  }

  void readReferences(Entry& entry) {
    if (entry.content == nullptr) return;
    for (const auto& [member, json] : entry.content->items()) {
      const PropertyPlan& plan = planFor(entry, member);
      const meta::Property& property = plan.property;
      if (!property->isReference() || !customizer_.shallReadProperty(entry.element, property)) continue;
      if (!property->isMany()) {
        if (json.is_null()) {
          builder_.setValue(entry.element, property, builder_.createEmptyOptionalValue(property));
          continue;
        }
        const ModelElement target = resolve(property, json);
        if (!target || !customizer_.shallAddReference(entry.element, property, target)) continue;
        notePlacement(property, target);
        builder_.setValue(entry.element, property, Value::createElementValue(target, property));
        continue;
      }
      if (!json.is_array()) wrongType(property, "an array", json);
      builder_.clearObjectValue(entry.element, property);
      for (const ordered_json& item : json) {
        const ModelElement target = resolve(property, item);
        if (!target || !customizer_.shallAddReference(entry.element, property, target)) continue;
        notePlacement(property, target);
        builder_.setObjectValue(entry.element, property, Value::createElementValue(target, property));
      }
    }
  }

  // The target a reference names: an element of the document, else whatever the
  // customizer finds. Null only for a reference to a skipped entry.
  ModelElement resolve(const meta::Property& property, const ordered_json& json) {
    if (!json.is_string()) wrongType(property, "a UUID string", json);
    const Uuid uuid = readUuid(json, [&] { return toUtf8(property.getQualifiedName()); });
    if (const ModelElement* element = byUuid_.find(uuid)) return *element;
    const auto targetClass = elementCast<meta::Class>(ModelElement(property->getType()));
    ModelElement found = customizer_.findReference(builder_, model_, targetClass, ElementId{uuid});
    if (!found) reportException(msg::DanglingReference(property.getQualifiedName(), toText(uuid)));
    return found;
  }

  // A document that places one element in two containers is inconsistent; the model
  // would quietly move it, so say so instead.
  void notePlacement(const meta::Property& property, const ModelElement& child) {
    if (!property->isContainment()) return;
    if (!placed_.insert(child.getImpl()).second) {
      malformed("element " + child.identifier() + " is contained twice");
    }
  }

  ParseCustomizer& customizer_;
  ModelBuilder& builder_;
  std::unordered_map<std::string, meta::Class> classes_;
  Model model_;
  std::vector<Entry> entries_;
  // The document's elements, and the UUIDs of entries the customizer skipped.
  qf::zero::internal::FlatTable<Uuid, ModelElement> byUuid_{qf::zero::internal::randomTableSeed()};
  std::unordered_set<Uuid, qf::zero::internal::KeyedUuidHash> skipped_;
  std::unordered_map<const void*, std::unordered_map<std::string, PropertyPlan>> plans_;
  std::unordered_set<const void*> placed_;
};

JSONParser::JSONParser() : JSONParser(nullptr, nullptr) {}

JSONParser::JSONParser(std::unique_ptr<ParseCustomizer> customizer, std::unique_ptr<ModelBuilder> builder)
    : customizer_(customizer ? std::move(customizer) : std::make_unique<ParseCustomizer>()),
      builder_(builder ? std::move(builder) : std::make_unique<ModelBuilder>()) {}

JSONParser::~JSONParser() = default;

std::vector<ParseItem> JSONParser::parseVerbatim(const ordered_json& document, const Model& model) {
  if (!document.is_object()) malformed("the document is not an object");
  const auto version = document.find(JSONConstants::VERSION_ATTR);
  if (version == document.end() || !version->is_string()) malformed("the document has no format version");
  customizer_->setVersion(version->get_ref<const std::string&>());
  if (const auto packages = document.find(JSONConstants::PACKAGES_ATTR); packages != document.end()) {
    if (!packages->is_array()) malformed("the package list is not an array");
    std::vector<std::string> uris;
    for (const ordered_json& uri : *packages) {
      if (!uri.is_string()) malformed("the package list holds " + internal::describeJson(uri));
      uris.push_back(uri.get<std::string>());
    }
    customizer_->setPackageUris(uris);
  }
  const auto entries = document.find(JSONConstants::ENTRIES_ATTR);
  if (entries == document.end() || !entries->is_array()) malformed("the document has no array of entries");
  std::vector<const ordered_json*> pointers;
  pointers.reserve(entries->size());
  for (const ordered_json& entry : *entries) pointers.push_back(&entry);
  return parseEntries(pointers, model);
}

std::vector<ParseItem> JSONParser::parseEntries(const std::vector<const ordered_json*>& entries,
                                                const Model& model) {
  Transaction transaction = model->beginTransaction(true);
  std::vector<ParseItem> items = Run(*customizer_, *builder_, model).parse(entries);
  transaction.commit();
  return items;
}

}  // namespace qf::zero::io
