// ParseCustomizer: the decisions a parse leaves to its user.
//
// Every hook has a default that reads a document exactly as the serializer wrote
// it: every entry becomes an element, every property written is read, and a
// reference resolves to an element of the document or of the target model.
#pragma once

#include "qf/zero/core/meta/structured_type.h"
#include "qf/zero/core/model.h"
#include "qf/zero/core/model_element.h"
#include "qf/zero/core/value.h"
#include "qf/zero/io/element_id.h"

#include <nlohmann/json_fwd.hpp>

#include <string>
#include <string_view>
#include <vector>

namespace qf::zero::io {

class ModelBuilder;

// The hooks through which a parse asks what to read, how to resolve references and how to
// read values; the defaults read a document as the serializer wrote it.
class ParseCustomizer {
 public:
  virtual ~ParseCustomizer() = default;

  // Whether the entry becomes an element. A skipped entry is not read; references to
  // it resolve like references to elements outside the document.
  virtual bool shallInstantiate(const meta::Class& type, const ElementId& id);
  // Whether a written property of an element is read.
  virtual bool shallReadProperty(const ModelElement& element, const meta::Property& property);
  // Whether a reference read from the document is stored.
  virtual bool shallAddReference(const ModelElement& element, const meta::Property& property,
                                 const ModelElement& target);
  // A reference to an element that is not in the document: the default asks the
  // builder for the model's element. Null makes the parse fail with "DanglingReference".
  virtual ModelElement findReference(ModelBuilder& builder, const Model& model, const meta::Class& metaClass,
                                     const ElementId& id);
  // Null when there is no such class or property; the parse then fails with
  // "NoSuchClass" or "NoSuchProperty".
  virtual meta::Class getMetaClass(std::u16string_view qualifiedName);
  virtual meta::Property getMetaProperty(const meta::StructuredType& type, std::u16string_view name);
  // A value of a primitive type written as text (UUID, DateTime and types with a text
  // form); an empty Value when the text is not one.
  virtual Value parsePrimitiveValue(const meta::Property& property, std::u16string_view text);
  // The document's format version; raises "UnsupportedFormatVersion" for any but "1.0".
  virtual void setVersion(std::string_view version);
  // The package URIs a document lists, when it lists them.
  virtual void setPackageUris(const std::vector<std::string>& uris);
};

}  // namespace qf::zero::io
