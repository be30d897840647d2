#include "qf/zero/io/json_serializer.h"

#include "attribute_codec.h"
#include "qf/zero/core/json_text.h"
#include "qf/zero/core/messages.h"
#include "qf/zero/core/meta/framework_package.h"
#include "qf/zero/core/model_impl.h"
#include "qf/zero/core/primitive_collection.h"
#include "qf/zero/core/reference_collection.h"
#include "qf/zero/core/report_exception.h"
#include "qf/zero/core/text.h"

#include <boost/date_time/posix_time/posix_time.hpp>

#include <nlohmann/json.hpp>

#include <algorithm>
#include <charconv>
#include <optional>
#include <string>
#include <unordered_map>
#include <unordered_set>

namespace qf::zero::io {

using nlohmann::ordered_json;

namespace {

ordered_json uuidJson(const ModelElement& element) { return element.identifier(); }

// The targets of a reference property in the order they are written: a sequence in its
// order, a set or map sorted by UUID.
std::vector<ModelElement> targetsInWrittenOrder(const ReferenceCollection& collection, bool ordered) {
  std::vector<ModelElement> targets = collection.getAllValuesAndProxies();
  if (!ordered) {
    std::sort(targets.begin(), targets.end(),
              [](const ModelElement& a, const ModelElement& b) { return a.getUuid() < b.getUuid(); });
  }
  return targets;
}

ordered_json referencesJson(const ReferenceCollection& collection, bool ordered) {
  ordered_json array = ordered_json::array();
  for (const ModelElement& target : targetsInWrittenOrder(collection, ordered))
    array.push_back(uuidJson(target));
  return array;
}

// A UUID's text in quotes, as dump() writes it, without the string and escaping work: the
// text is hex digits and dashes only.
void appendQuotedUuid(std::string& out, const Uuid& id) {
  static constexpr char digits[] = "0123456789abcdef";
  char text[38];
  std::size_t at = 0;
  text[at++] = '"';
  for (std::size_t i = 0; i < 16; ++i) {
    if (i == 4 || i == 6 || i == 8 || i == 10) text[at++] = '-';
    const auto byte = static_cast<unsigned char>(id.data[i]);
    text[at++] = digits[byte >> 4];
    text[at++] = digits[byte & 0x0f];
  }
  text[at++] = '"';
  out.append(text, at);
}

// A reference property as text: what referencesJson or uuidJson would give, dumped.
void appendReferences(std::string& out, const ReferenceCollection& collection, bool ordered) {
  const std::vector<ModelElement> targets = targetsInWrittenOrder(collection, ordered);
  out += '[';
  for (std::size_t i = 0; i < targets.size(); ++i) {
    if (i > 0) out += ',';
    appendQuotedUuid(out, targets[i].getUuid());
  }
  out += ']';
}

// `text` as dump() writes a JSON string holding toUtf8(text): quoted, with '"', '\\' and the
// control characters escaped, and nothing else (no ASCII escaping).
void appendJsonString(std::string& out, std::u16string_view text) {
  out += '"';
  const std::size_t start = out.size();
  foundation::core::text::appendUtf8(out, text);
  const auto needsEscape = [](char c) {
    return static_cast<unsigned char>(c) < 0x20 || c == '"' || c == '\\';
  };
  const auto first = std::find_if(out.begin() + static_cast<std::ptrdiff_t>(start), out.end(), needsEscape);
  if (first != out.end()) {
    const std::string tail(first, out.end());
    out.erase(first, out.end());
    for (const char c : tail) {
      switch (c) {
        case '"':
          out += "\\\"";
          break;
        case '\\':
          out += "\\\\";
          break;
        case '\b':
          out += "\\b";
          break;
        case '\f':
          out += "\\f";
          break;
        case '\n':
          out += "\\n";
          break;
        case '\r':
          out += "\\r";
          break;
        case '\t':
          out += "\\t";
          break;
        default:
          if (static_cast<unsigned char>(c) < 0x20) {
            static constexpr char digits[] = "0123456789abcdef";
            out += "\\u00";
            out += digits[(c >> 4) & 0x0f];
            out += digits[c & 0x0f];
          } else {
            out += c;
          }
      }
    }
  }
  out += '"';
}

// A value that does not say which property it belongs to, written by what it holds.
ordered_json writeByHeldType(const Value& value) {
  if (value.holds<std::u16string>()) return toUtf8(value.getValue<std::u16string>());
  if (value.holds<int>()) return value.getValue<int>();
  if (value.holds<bool>()) return value.getValue<bool>();
  if (value.holds<JsonValue>()) return value.getValue<JsonValue>();
  if (value.holds<Uuid>()) return toText(value.getValue<Uuid>());
  if (value.holds<DateTime>()) return boost::posix_time::to_iso_extended_string(value.getValue<DateTime>());
  return nullptr;
}

// A text grown entry by entry is copied at every doubling, and each doubling touches fresh
// pages: for a document of some megabytes that cost more than the writing itself. So the text
// is sized up front for the entries after the first: evenly spaced ones are written once more
// on their own, and their mean size is taken with an eighth to spare. A sample that guessed low
// costs one doubling. Small documents are not sampled.
template <class WriteText>
std::size_t estimatedTextSize(const std::vector<ModelElement>& elements, const WriteText& writeText) {
  constexpr std::size_t kSamples = 256;
  if (elements.size() < 2 * kSamples) return 0;
  const std::size_t step = (elements.size() - 1) / kSamples;
  std::size_t sampledSize = 0;
  std::string scratch;
  for (std::size_t sample = 0; sample < kSamples; ++sample) {
    scratch.clear();
    writeText(elements[1 + step / 2 + sample * step], scratch);
    sampledSize += scratch.size() + 1;
  }
  return (elements.size() - 1) * (sampledSize / kSamples) / 8 * 9 + 2;
}

}  // namespace

std::vector<ModelElement> SerializeCustomizer::getAggregateMembers(const ModelElement&) const { return {}; }

std::vector<ModelElement> ContainmentAggregateCustomizer::getAggregateMembers(
    const ModelElement& element) const {
  std::vector<ModelElement> children;
  for (const meta::Property& property : element->allProperties()) {
    if (!property->isContainment()) continue;
    if (property->isMany()) {
      auto* collection = static_cast<ReferenceCollection*>(element->basicGetCollection(property));
      for (const ModelElement& child : collection->getAllValues()) children.push_back(child);
    } else if (const Value child = element->basicGetValue(property); child.isElement()) {
      children.push_back(child.getElement());
    }
  }
  return children;
}

// Writes entries; keeps what it learns of each class (the properties to write and
// how) for the serializer's life.
class JSONSerializer::EntryWriter {
 public:
  EntryWriter(ModelTraverser& traverser, const SerializeCustomizer& customizer)
      : traverser_(traverser), customizer_(customizer) {}

  ordered_json write(const ModelElement& element) {
    const ClassPlan& plan = planFor(element.getMetaClass());
    ordered_json entry = ordered_json::object();
    entry.get_ref<ordered_json::object_t&>().reserve(3);
    entry[JSONConstants::TYPE_ATTR] = plan.typeName;
    entry[JSONConstants::ID_ATTR] = element.identifier();
    ordered_json& content = entry[JSONConstants::CONTENT_ATTR] = ordered_json::object();
    content.get_ref<ordered_json::object_t&>().reserve(plan.properties.size());
    for (const PropertyPlan& property : plan.properties) writeProperty(*element.getImpl(), property, content);
    return entry;
  }

  // Appends the text of write(element).dump() to `out`; a value held as text is copied.
  void writeText(const ModelElement& element, std::string& out) {
    ClassPlan& plan = planFor(element.getMetaClass());
    // An entry written alone gets the room its class's last entry took, and a little more,
    // so that it is neither regrown nor copied to fit.
    const bool alone = out.empty();
    if (alone) out.reserve(plan.entryTextSize + kEntryTextSlack);
    out += plan.entryStart;
    appendQuotedUuid(out, element.getUuid());
    out += R"(,"content":{)";
    const ModelElement::Impl& impl = *element.getImpl();
    const bool skipDefaults = customizer_.shouldSkipDefaultValues();
    bool first = true;
    ordered_json scratch = ordered_json::object();
    for (const PropertyPlan& property : plan.properties) {
      if (property.reference) {
        if (writeReferenceText(impl, property, first, out)) first = false;
        continue;
      }
      const JsonText* held = property.mayBeHeldAsText ? impl.basicGetHeldText(property.property) : nullptr;
      if (held != nullptr) {
        if (skipDefaults && property.defaultText && held->text() == *property.defaultText) continue;
        out += first ? "" : ",";
        out += property.key;
        out += held->text();
        first = false;
        continue;
      }
      if (property.scalarText) {
        if (writeScalarText(impl, property, first, out)) first = false;
        continue;
      }
      writeProperty(impl, property, scratch);
      if (scratch.empty()) continue;
      out += first ? "" : ",";
      out += property.key;
      out += scratch.begin()->dump();
      scratch.clear();
      first = false;
    }
    out += "}}";
    if (alone) plan.entryTextSize = out.size();
  }

 private:
  struct PropertyPlan {
    meta::Property property;
    std::string name;
    bool reference;
    internal::AttributeCodec codec;
    Value defaultValue;
    std::string key;                         // "<name>": as written in text
    bool mayBeHeldAsText = false;            // a single JsonValue
    bool scalarText = false;                 // a single string, integer or boolean, written as text directly
    std::optional<std::string> defaultText;  // the default of such a property, as text
  };
  struct ClassPlan {
    std::string typeName;
    std::string entryStart;  // {"type":"<typeName>","id":
    std::vector<PropertyPlan> properties;
    std::size_t entryTextSize = 0;  // of the last entry written alone
  };
  static constexpr std::size_t kEntryTextSlack = 8;

  ClassPlan& planFor(const meta::Class& metaClass) {
    if (auto it = plans_.find(metaClass.getImpl()); it != plans_.end()) return it->second;
    ClassPlan plan;
    plan.typeName = toUtf8(metaClass.getQualifiedName());
    plan.entryStart = std::string("{\"") + JSONConstants::TYPE_ATTR +
                      "\":" + ordered_json(plan.typeName).dump() + ",\"" + JSONConstants::ID_ATTR + "\":";
    for (const meta::Property& property : traverser_.getProperties(metaClass, PropertyCategory::All)) {
      PropertyPlan entry{
          property, toUtf8(property.getName()), property->isReference(), {}, {}, {}, false, false, {}};
      entry.key = ordered_json(entry.name).dump() + ":";
      if (!entry.reference) {
        entry.codec = internal::codecFor(property->getType());
        if (entry.codec.kind == internal::AttributeKind::Opaque) continue;
        if (!property->isMany()) entry.defaultValue = property->getDefaultValue();
        entry.scalarText = !property->isMany() && (entry.codec.kind == internal::AttributeKind::String ||
                                                   entry.codec.kind == internal::AttributeKind::Integer ||
                                                   entry.codec.kind == internal::AttributeKind::Boolean);
        if (!property->isMany() && entry.codec.kind == internal::AttributeKind::Json) {
          entry.mayBeHeldAsText = true;
          if (!entry.defaultValue.isEmpty()) {
            entry.defaultText = internal::writeAttribute(property, entry.codec, entry.defaultValue).dump();
          }
        }
      }
      plan.properties.push_back(std::move(entry));
    }
    return plans_.emplace(metaClass.getImpl(), std::move(plan)).first->second;
  }

  void writeProperty(const ModelElement::Impl& element, const PropertyPlan& plan,
                     ordered_json& content) const {
    const meta::Property& property = plan.property;
    const bool skipDefaults = customizer_.shouldSkipDefaultValues();
    if (property->isMany()) {
      AbstractOwnedCollection* collection = element.basicGetCollection(property);
      if (skipDefaults && collection->size() == 0) return;
      if (plan.reference) {
        content[plan.name] =
            referencesJson(*static_cast<ReferenceCollection*>(collection), property->isSequence());
        return;
      }
      ordered_json array = ordered_json::array();
      for (const Value& item : static_cast<PrimitiveCollection*>(collection)->getAllValues()) {
        array.push_back(internal::writeAttribute(property, plan.codec, item));
      }
      if (!property->isSequence()) std::sort(array.begin(), array.end());
      content[plan.name] = std::move(array);
      return;
    }
    const Value value = element.basicGetValue(property);
    if (plan.reference) {
      if (skipDefaults && value.isEmpty()) return;
      content[plan.name] = value.isElement() ? uuidJson(value.getElement()) : ordered_json(nullptr);
      return;
    }
    if (skipDefaults && (value.isEmpty() || value == plan.defaultValue)) return;
    content[plan.name] = internal::writeAttribute(property, plan.codec, value);
  }

  // writeProperty for a property planned as scalarText, as text; false when skipped as a default.
  bool writeScalarText(const ModelElement::Impl& element, const PropertyPlan& plan, bool first,
                       std::string& out) const {
    const Value value = element.basicGetValue(plan.property);
    if (customizer_.shouldSkipDefaultValues() && (value.isEmpty() || value == plan.defaultValue))
      return false;
    out += first ? "" : ",";
    out += plan.key;
    if (value.isEmpty()) {
      out += "null";
      return true;
    }
    switch (plan.codec.kind) {
      case internal::AttributeKind::String:
        if (const std::u16string* text = value.peek<std::u16string>()) {
          appendJsonString(out, *text);
        } else {
          appendJsonString(out, value.getValue<std::u16string>());
        }
        break;
      case internal::AttributeKind::Integer: {
        char digits[16];
        const auto end = std::to_chars(digits, digits + sizeof digits, value.getValue<int>()).ptr;
        out.append(digits, end);
        break;
      }
      default:
        out += value.getValue<bool>() ? "true" : "false";
        break;
    }
    return true;
  }

  // writeProperty for a reference, as text; false when skipped as a default.
  bool writeReferenceText(const ModelElement::Impl& element, const PropertyPlan& plan, bool first,
                          std::string& out) const {
    const meta::Property& property = plan.property;
    const bool skipDefaults = customizer_.shouldSkipDefaultValues();
    if (property->isMany()) {
      auto* collection = static_cast<ReferenceCollection*>(element.basicGetCollection(property));
      if (skipDefaults && collection->size() == 0) return false;
      out += first ? "" : ",";
      out += plan.key;
      appendReferences(out, *collection, property->isSequence());
      return true;
    }
    const Value value = element.basicGetValue(property);
    if (skipDefaults && value.isEmpty()) return false;
    out += first ? "" : ",";
    out += plan.key;
    if (value.isElement()) {
      appendQuotedUuid(out, value.getElement().getUuid());
    } else {
      out += "null";
    }
    return true;
  }

  ModelTraverser& traverser_;
  const SerializeCustomizer& customizer_;
  std::unordered_map<const void*, ClassPlan> plans_;
};

JSONSerializer::JSONSerializer()
    : JSONSerializer(std::make_unique<JSONModelTraverser>(), std::make_unique<SerializeCustomizer>()) {}

JSONSerializer::JSONSerializer(std::unique_ptr<ModelTraverser> traverser,
                               std::unique_ptr<SerializeCustomizer> customizer)
    : traverser_(traverser ? std::move(traverser) : std::make_unique<JSONModelTraverser>()),
      customizer_(customizer ? std::move(customizer) : std::make_unique<SerializeCustomizer>()),
      writer_(std::make_unique<EntryWriter>(*traverser_, *customizer_)) {}

JSONSerializer::~JSONSerializer() = default;

ordered_json JSONSerializer::newDocument() const {
  ordered_json document = ordered_json::object();
  document[JSONConstants::VERSION_ATTR] = customizer_->getFormatVersion();
  document[JSONConstants::ENTRIES_ATTR] = ordered_json::array();
  return document;
}

void JSONSerializer::emit(ordered_json&& document, const SerializationOutput& output) const {
  if (output.getJson() != nullptr) *output.getJson() = std::move(document);
  if (output.getText() != nullptr) *output.getText() = document.dump();
}

ordered_json JSONSerializer::writeEntry(const ModelElement& element) { return writer_->write(element); }

std::string JSONSerializer::writeEntryText(const ModelElement& element) {
  std::string text;
  try {
    writer_->writeText(element, text);
  } catch (const nlohmann::json::type_error&) {
    reportException(qf0::messages::InvalidValue());
  }
  return text;
}

void JSONSerializer::serialize(const ModelElement& element, const SerializationOutput& output) {
  serialize(std::vector<ModelElement>{element}, output);
}

void JSONSerializer::serialize(const std::vector<ModelElement>& elements, const SerializationOutput& output) {
  std::vector<ModelElement> order;
  std::unordered_set<ModelElement> written;
  std::vector<ModelElement> pending;
  for (const ModelElement& root : elements) {
    pending.push_back(root);
    while (!pending.empty()) {
      ModelElement element = std::move(pending.back());
      pending.pop_back();
      if (!element || !written.insert(element).second) continue;
      std::vector<ModelElement> members = customizer_->getAggregateMembers(element);
      pending.insert(pending.end(), members.rbegin(), members.rend());
      order.push_back(std::move(element));
    }
  }
  emitEntries(order, output);
}

void JSONSerializer::serialize(const Model& model, const SerializationOutput& output) {
  std::vector<ModelElement> order;
  const ContainmentAggregateCustomizer containment;
  std::vector<ModelElement> pending;
  for (const ModelElement& top : model->getTopLevelElements()) {
    pending.push_back(top);
    while (!pending.empty()) {
      ModelElement element = std::move(pending.back());
      pending.pop_back();
      std::vector<ModelElement> children = containment.getAggregateMembers(element);
      pending.insert(pending.end(), children.rbegin(), children.rend());
      order.push_back(std::move(element));
    }
  }
  emitEntries(order, output);
}

void JSONSerializer::emitEntries(const std::vector<ModelElement>& elements,
                                 const SerializationOutput& output) {
  if (output.getJson() == nullptr && output.getText() != nullptr) {
    std::string& text = *output.getText();
    text.clear();
    const auto writer = [&](const ModelElement& element, std::string& out) {
      writer_->writeText(element, out);
    };
    text += std::string("{\"") + JSONConstants::VERSION_ATTR +
            "\":" + ordered_json(customizer_->getFormatVersion()).dump() + ",\"" +
            JSONConstants::ENTRIES_ATTR + "\":[";
    for (std::size_t i = 0; i < elements.size(); ++i) {
      if (i > 0) text += ',';
      writer_->writeText(elements[i], text);
      // The first entry is often the container of all the others, far larger than any of them,
      // so the rest is sized once it is written.
      if (i == 0) text.reserve(text.size() + estimatedTextSize(elements, writer));
    }
    text += "]}";
    return;
  }
  ordered_json document = newDocument();
  ordered_json& entries = document[JSONConstants::ENTRIES_ATTR];
  entries.get_ref<ordered_json::array_t&>().reserve(elements.size());
  for (const ModelElement& element : elements) entries.push_back(writer_->write(element));
  emit(std::move(document), output);
}

void JSONSerializer::serialize(const Value& value, const SerializationOutput& output) {
  ordered_json json;
  const meta::Property& property = value.getMeta().getProperty();
  if (value.isElement()) {
    json = uuidJson(value.getElement());
  } else if (value.holds<AbstractOwnedCollection*>()) {
    auto* collection = value.getValue<AbstractOwnedCollection*>();
    if (auto* references = dynamic_cast<ReferenceCollection*>(collection)) {
      json = referencesJson(*references, property && property->isSequence());
    } else {
      json = ordered_json::array();
      const internal::AttributeCodec codec = internal::codecFor(property->getType());
      for (const Value& item : static_cast<PrimitiveCollection*>(collection)->getAllValues()) {
        json.push_back(internal::writeAttribute(property, codec, item));
      }
    }
  } else if (value.isList()) {
    json = ordered_json::array();
    for (const Value& item : value.getList()) {
      ordered_json itemJson;
      serialize(item, SerializationOutput::forIntermediateFormat(&itemJson));
      json.push_back(std::move(itemJson));
    }
  } else if (property && !value.isEmpty()) {
    json = internal::writeAttribute(property, internal::codecFor(property->getType()), value);
  } else if (!value.isEmpty()) {
    json = writeByHeldType(value);
  }
  emit(std::move(json), output);
}

}  // namespace qf::zero::io
