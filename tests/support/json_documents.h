// Helpers for tests of JSON documents.
#pragma once

#include "qf/zero/core/model.h"
#include "qf/zero/io/json_serializer.h"

#include <nlohmann/json.hpp>

#include <map>
#include <string>

namespace support {

inline nlohmann::ordered_json serializeModel(const qf::zero::Model& model, bool skipDefaults = false) {
  nlohmann::ordered_json document;
  qf::zero::io::JSONSerializer serializer;
  serializer.getCustomizer().setShouldSkipDefaultValues(skipDefaults);
  serializer.serialize(model, qf::zero::io::SerializationOutput::forIntermediateFormat(&document));
  return document;
}

// The entries of a document by element id: equal maps mean the same elements with
// the same values, whatever the order of the entries.
inline std::map<std::string, nlohmann::ordered_json> entriesById(const nlohmann::ordered_json& document) {
  std::map<std::string, nlohmann::ordered_json> byId;
  for (const auto& entry : document.at("entries")) byId.emplace(entry.at("id").get<std::string>(), entry);
  return byId;
}

}  // namespace support
