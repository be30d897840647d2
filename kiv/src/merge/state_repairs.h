// Makes a merged state whole: every element a merged element refers to or contains is
// kept, both ends of each opposite pair agree, and no element contains itself.
#pragma once

#include "kiv/merge/property_merge_tool.h"
#include "merge/entry_schema.h"
#include "merge/merged_state.h"

#include <map>
#include <utility>

namespace kiv::merge {

// Repairs are recorded once per element, property and kind, with the value before the
// first repair and after the last.
class RepairLog {
 public:
  explicit RepairLog(std::vector<MergeConflict>& conflicts) : conflicts_(conflicts) {}
  void record(const qf::zero::Uuid& element, const qf::zero::JsonValue& entry, const std::string& property,
              ConflictKind kind, const qf::zero::JsonValue& before, const qf::zero::JsonValue& after);

 private:
  std::vector<MergeConflict>& conflicts_;
  std::map<std::tuple<qf::zero::Uuid, std::string, ConflictKind>, std::size_t> positions_;
};

// REQUIRES: `state` holds every element the tool settled. Bounded: an element is
// revisited a fixed number of times at most, so the repairs always end.
void repairMergedState(MergedState& state, EntrySchemas& schemas, RepairLog& log);

}  // namespace kiv::merge
