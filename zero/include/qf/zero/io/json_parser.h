// JSONParser: rebuilds elements from a JSON document, keeping the UUIDs written.
//
//   io::JSONParser parser;
//   std::vector<io::ParseItem> items = parser.parseVerbatim(document, model);
//   ModelElement first = items.front().getValue().getElement();
//
// Every element of the document is created first and the values are set second:
// attributes of all entries, then references, so references among entries resolve
// in any order and maps find the keys of their members. The parse runs in one
// transaction (a savepoint of the caller's, when one is open): when it fails, the
// model is as it was and the error says what was wrong and where.
#pragma once

#include "qf/zero/core/model.h"
#include "qf/zero/core/value.h"
#include "qf/zero/io/model_builder.h"
#include "qf/zero/io/parse_customizer.h"

#include <nlohmann/json_fwd.hpp>

#include <memory>
#include <vector>

namespace qf::zero::io {

// What a parse made of one entry: the element created or refreshed for it, as a Value.
class ParseItem {
 public:
  explicit ParseItem(Value value) : value_(std::move(value)) {}
  // The element made (or refreshed) for one entry.
  const Value& getValue() const noexcept { return value_; }

 private:
  Value value_;
};

// Rebuilds the elements of a document in one transaction, all or nothing, keeping the UUIDs
// written; its customizer decides what is read, its builder how elements are made.
class JSONParser {
 public:
  // The default customizer and a builder that creates a new element per entry.
  JSONParser();
  JSONParser(std::unique_ptr<ParseCustomizer> customizer, std::unique_ptr<ModelBuilder> builder);
  ~JSONParser();
  JSONParser(const JSONParser&) = delete;
  JSONParser& operator=(const JSONParser&) = delete;

  ParseCustomizer& getCustomizer() noexcept { return *customizer_; }
  ModelBuilder& getBuilder() noexcept { return *builder_; }

  // The elements of the document's entries, in entry order (skipped entries omitted).
  // Raises "MalformedDocument", "UnsupportedFormatVersion", "NoSuchClass",
  // "NoSuchProperty", "WrongJsonType", "DanglingReference" or "DuplicateElementId", and
  // whatever the model refuses (a containment cycle, a taken map key ...).
  std::vector<ParseItem> parseVerbatim(const nlohmann::ordered_json& document, const Model& model);

  // The same for bare entries, without a document around them.
  std::vector<ParseItem> parseEntries(const std::vector<const nlohmann::ordered_json*>& entries,
                                      const Model& model);

 private:
  class Run;
  std::unique_ptr<ParseCustomizer> customizer_;
  std::unique_ptr<ModelBuilder> builder_;
};

}  // namespace qf::zero::io
