// ModelBuilder: the object through which a parse creates and fills elements.
//
// The default builder creates a new element for every entry and stores values as a
// builder does (read-only and set-once properties included). A subclass may reuse
// elements that exist already, or refuse to create some.
#pragma once

#include "qf/zero/core/meta/framework_package.h"
#include "qf/zero/core/meta/structured_type.h"
#include "qf/zero/core/model.h"
#include "qf/zero/core/model_element.h"
#include "qf/zero/core/value.h"
#include "qf/zero/io/element_id.h"

namespace qf::zero::io {

// Makes and fills the elements of a parse. The default makes a new element for every entry
// and refuses a UUID the model holds already.
class ModelBuilder {
 public:
  virtual ~ModelBuilder() = default;

  // A new element of `metaClass` in `model` with the id's UUID (a fresh one when the id
  // carries none). Raises "DuplicateElementId" when the model holds that UUID already.
  virtual ModelElement instantiate(const Model& model, const meta::Class& metaClass, const ElementId& id);
  // The value a datatype's parse starts from (the datatype serializer's default).
  virtual Value instantiateDataType(const meta::DataType& type);
  // The element of the model that a reference names, or a null handle.
  virtual ModelElement findReference(const Model& model, const meta::Class& metaClass, const ElementId& id);

  // Stores a single-valued property; storing the current value changes nothing.
  virtual void setValue(ModelElement& element, const meta::Property& property, const Value& value);
  // Stores a single-valued JsonValue property from the parsed document's own value, as
  // setValue does with a Value of `json`; an element that keeps the property as text
  // takes it without the Value's copy of the tree. A builder that overrides setValue to
  // store values differently overrides this too.
  virtual void setJsonValue(ModelElement& element, const meta::Property& property, const JsonValue& json);
  // Adds one item to a many-valued property.
  virtual void setObjectValue(ModelElement& element, const meta::Property& property, const Value& item);
  // Empties a many-valued property before the parse refills it.
  virtual void clearObjectValue(ModelElement& element, const meta::Property& property);
  // The value written as null for an optional property.
  virtual Value createEmptyOptionalValue(const meta::Property& property);

 protected:
  // The live element of `model` that the id names, or a null handle: what builders that
  // refresh elements in place reuse.
  static ModelElement findLiveElement(const Model& model, const ElementId& id);
};

// Reuses the live element that has the entry's UUID, so that parsing into a model
// that holds an element refreshes it in place.
class ElementReusingModelBuilder : public ModelBuilder {
 public:
  ModelElement instantiate(const Model& model, const meta::Class& metaClass, const ElementId& id) override;
};

}  // namespace qf::zero::io
