// What merging needs to know of a stored entry's class: each property's shape and, for
// references, where the opposite end lives. Looked up once per class per merge.
#pragma once

#include "qf/zero/core/meta/framework_package.h"
#include "qf/zero/core/meta/property.h"
#include "qf/zero/core/uuid.h"

#include <nlohmann/json.hpp>

#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

namespace kiv::merge {

enum class Shape { Single, Set, Sequence };

struct PropertySchema {
  std::string name;
  Shape shape = Shape::Single;
  bool reference = false;
  bool containment = false;
  std::string opposite;  // the opposite end's name on the target, empty without one
  Shape oppositeShape = Shape::Single;
  bool containerEnd = false;  // a single end whose opposite contains this element
};

struct EntrySchema {
  std::vector<PropertySchema> properties;
  bool hasReferences = false;
  const PropertySchema* find(std::string_view name) const;
};

class EntrySchemas {
 public:
  // The schema of the entry's class; an entry whose type names no registered class has
  // an empty one (its values merge as single values).
  const EntrySchema& of(const qf::zero::JsonValue& entry);

 private:
  std::unordered_map<std::string, EntrySchema> byType_;
};

// The JSON members of an entry.
const qf::zero::JsonValue& contentOf(const qf::zero::JsonValue& entry);
qf::zero::JsonValue& contentOf(qf::zero::JsonValue& entry);
std::string typeOf(const qf::zero::JsonValue& entry);

// The elements a reference value names: one UUID text or an array of them.
std::vector<qf::zero::Uuid> referencedBy(const qf::zero::JsonValue& value);

}  // namespace kiv::merge
