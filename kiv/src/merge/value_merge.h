// Three-way merges of one property's values, as JSON: a single value, an unordered set,
// an ordered sequence. A missing value is null (single) or empty (collections).
#pragma once

#include "qf/zero/core/meta/framework_package.h"

#include <nlohmann/json.hpp>

namespace kiv::merge {

struct ValueMerge {
  qf::zero::JsonValue value;
  bool conflict = false;  // both sides changed it differently; `value` is the preferred side's
};

ValueMerge mergeSingle(const qf::zero::JsonValue& base, const qf::zero::JsonValue& ours,
                       const qf::zero::JsonValue& theirs, bool preferTheirs);

// Every addition and removal of both sides, sorted as the serializer writes a set.
ValueMerge mergeSet(const qf::zero::JsonValue& base, const qf::zero::JsonValue& ours,
                    const qf::zero::JsonValue& theirs);

// By identity: an item is its value and its occurrence among equal values.
ValueMerge mergeSequence(const qf::zero::JsonValue& base, const qf::zero::JsonValue& ours,
                         const qf::zero::JsonValue& theirs, bool preferTheirs);

}  // namespace kiv::merge
