// JSONSerializer: writes elements, values or whole models as JSON documents.
//
//   nlohmann::ordered_json document;
//   io::JSONSerializer().serialize(model, io::SerializationOutput::forIntermediateFormat(&document));
//
// The document layout is described in json_constants.h. Many-valued properties keep
// their order when ordered; sets and maps are written sorted (references by UUID,
// values by their JSON form) so that equal models give identical documents.
//
// Written as text (SerializationOutput::forText), a document is the same text as the dump of
// its intermediate form, but made without building that form: entries are written one by
// one, and a JsonValue property that an element keeps as text is copied as it is.
#pragma once

#include "qf/zero/core/model.h"
#include "qf/zero/core/model_element.h"
#include "qf/zero/core/value.h"
#include "qf/zero/io/model_traverser.h"
#include "qf/zero/io/serialization_output.h"
#include "qf/zero/io/serialize_customizer.h"

#include <nlohmann/json_fwd.hpp>

#include <memory>
#include <string>
#include <vector>

namespace qf::zero::io {

// What a serializer does: an element becomes a document with its aggregate, a value its bare
// JSON form.
class Serializer {
 public:
  virtual ~Serializer() = default;
  // A document holding the element and the aggregate its customizer adds.
  virtual void serialize(const ModelElement& element, const SerializationOutput& output) = 0;
  // The bare JSON form of a value: an element by its UUID text, a collection as an array.
  virtual void serialize(const Value& value, const SerializationOutput& output) = 0;
};

// Writes documents in the layout of json_constants.h; equal models give identical documents.
// Its traverser picks the properties written, its customizer the elements written alongside.
class JSONSerializer final : public Serializer {
 public:
  // A JSON model traverser and a default customizer (format "1.0", defaults written).
  JSONSerializer();
  JSONSerializer(std::unique_ptr<ModelTraverser> traverser, std::unique_ptr<SerializeCustomizer> customizer);
  ~JSONSerializer() override;
  JSONSerializer(const JSONSerializer&) = delete;
  JSONSerializer& operator=(const JSONSerializer&) = delete;

  SerializeCustomizer& getCustomizer() noexcept { return *customizer_; }
  ModelTraverser& getTraverser() noexcept { return *traverser_; }

  void serialize(const ModelElement& element, const SerializationOutput& output) override;
  void serialize(const Value& value, const SerializationOutput& output) override;
  // A document of the given elements, in order, each followed by its aggregate.
  void serialize(const std::vector<ModelElement>& elements, const SerializationOutput& output);
  // A document of every live element of the model: top-level elements in model
  // order, each followed depth-first by the children it contains.
  void serialize(const Model& model, const SerializationOutput& output);

  // The entry of one element, without a document around it.
  nlohmann::ordered_json writeEntry(const ModelElement& element);
  // writeEntry(element) as its compact text (no ASCII escaping), written without building
  // the tree. Raises "InvalidValue" when a JSON value in the entry holds a string that is
  // not valid UTF-8, as a JsonText of the entry would.
  std::string writeEntryText(const ModelElement& element);

 private:
  class EntryWriter;
  void emit(nlohmann::ordered_json&& document, const SerializationOutput& output) const;
  // A document of these elements' entries, in order.
  void emitEntries(const std::vector<ModelElement>& elements, const SerializationOutput& output);
  nlohmann::ordered_json newDocument() const;

  std::unique_ptr<ModelTraverser> traverser_;
  std::unique_ptr<SerializeCustomizer> customizer_;
  std::unique_ptr<EntryWriter> writer_;
};

}  // namespace qf::zero::io
