// Helpers for tests of JSON documents.
#pragma once

#include "qf/zero/core/model.h"
#include "qf/zero/io/json_serializer.h"

#include <nlohmann/json.hpp>

#include <cstdint>
#include <limits>
#include <map>
#include <random>
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

// A random JSON value of every kind: integers and floats at their edges, strings that need
// escapes or are not plain ASCII, and nesting up to four levels.
inline nlohmann::ordered_json randomJsonValue(std::mt19937& random, int depth = 0) {
  using nlohmann::ordered_json;
  const auto pick = [&](int n) { return std::uniform_int_distribution<int>(0, n - 1)(random); };
  switch (depth > 2 ? pick(5) : pick(7)) {
    case 0:
      return nullptr;
    case 1:
      return pick(2) == 0;
    case 2: {
      static const ordered_json integers[] = {0, -1, std::numeric_limits<std::int64_t>::min(),
                                              std::numeric_limits<std::int64_t>::max(),
                                              std::numeric_limits<std::uint64_t>::max()};
      return pick(2) == 0 ? ordered_json(pick(2000) - 1000) : integers[pick(5)];
    }
    case 3: {
      static const double floats[] = {0.1, -2.5, 1e300, 5e-324, 1e-7};
      return pick(2) == 0 ? (pick(2000) - 1000) / 7.0 : floats[pick(5)];
    }
    case 4: {
      static const char* const texts[] = {
          "",         "a",        "Grüße",        "line\nbreak", "quote \" and \\", "日本",
          "\x01\x1f", "del \x7f", "\u2028\u2029", "tab\there",   "/slash/",         "\U0001F600"};
      if (pick(2) == 0) return texts[pick(12)];
      // Longer strings of the bytes at the edges of what is written as it stands, so that
      // every position of an eight-byte word meets each of them.
      static const char* const pieces[] = {"\x1f", " ", "!", "\"", "\\", "[", "]", "~", "\x7f", "a", "é"};
      std::string text;
      for (int i = pick(40); i > 0; --i) text += pick(4) == 0 ? pieces[pick(11)] : "a";
      return text;
    }
    case 5: {
      ordered_json array = ordered_json::array();
      for (int i = pick(4); i > 0; --i) array.push_back(randomJsonValue(random, depth + 1));
      return array;
    }
    default: {
      ordered_json object = ordered_json::object();
      for (int i = pick(4); i > 0; --i)
        object["k" + std::to_string(pick(5))] = randomJsonValue(random, depth + 1);
      return object;
    }
  }
}

}  // namespace support
