// PropertyMergeTool: settles, property by property, the elements that both sides of a
// three-way merge changed, so that no change is lost without a record.
//
//   auto tool = std::make_unique<kiv::PropertyMergeTool>(kiv::ConflictPolicy::PreferOurs);
//   const kiv::PropertyMergeTool& settled = *tool;
//   kiv::RecursiveMerge3Strategy strategy(std::move(tool));
//   ours->merge(theirs, strategy);
//   for (const kiv::MergeConflict& conflict : settled.conflicts()) show(conflict);
//
// Rules, comparing the base, ours and theirs entries of each element:
// - A property changed on one side takes that side; changed to the same value on both
//   sides, it takes that value. A single value changed differently is a conflict.
// - Sets and maps merge as sets: every addition and removal of either side applies, and
//   nothing there is a conflict (a map's entries are its targets; their keys are their
//   own properties, merged with them).
// - Ordered sequences merge by identity (an attribute value counts with its occurrence):
//   removals of either side apply; insertions of both sides are kept after the item that
//   precedes them on their side, the preferred side's first where both inserted at one
//   place; when both sides reordered the surviving items differently, that is a
//   conflict, and the preferred side's order is taken.
// - An element deleted on one side and changed on the other is kept as changed.
// - The merged state is made whole: an element that the merge would delete but that a
//   merged element still refers to or contains is kept; both ends of a property with an
//   opposite are made to agree, a single-valued end (a child's container) deciding; a
//   containment cycle made by two moves is broken by undoing one of them.
// Conflicts are data: each is recorded and settled by the policy; nothing raises.
//
// The conflict list grows with every run until cleared (a recursive merge runs the tool
// for its inner merges too). A tool is used by one thread at a time.
#pragma once

#include "kiv/merge/merge_tool.h"
#include "qf/zero/core/meta/framework_package.h"
#include "qf/zero/core/uuid.h"

#include <nlohmann/json.hpp>

#include <string>
#include <string_view>
#include <vector>

namespace kiv {

enum class ConflictPolicy { PreferTheirs, PreferOurs };

enum class MergeSide { Base, Ours, Theirs };

enum class ConflictKind {
  BothChanged,       // a single value set differently, or a sequence reordered differently
  DeleteModify,      // deleted on one side, changed on the other: kept as changed
  KeptReferenced,    // deleted, but a merged element refers to it or contains it: kept
  OppositeEnd,       // one end of an opposite pair dropped or added to agree with the other
  ContainmentCycle,  // a move undone (back to the base container) to break a cycle
};

std::string_view toString(ConflictKind kind);

// One conflict PropertyMergeTool met: the element and property, what each side and the merged
// state hold, and the side taken. A record only: the merge has settled it already.
struct MergeConflict {
  qf::zero::Uuid element;
  std::string type;      // the element's qualified class name
  std::string property;  // empty for conflicts about the whole element
  ConflictKind kind = ConflictKind::BothChanged;
  // The property's values (the whole entries when `property` is empty) on each side and
  // in the merged state: null where a side has none. A repair records only the value
  // the element had in the merge before it (as `base`) and after it.
  qf::zero::JsonValue base, ours, theirs, merged;
  MergeSide chosen = MergeSide::Theirs;
};

// Merges the elements both sides changed property by property and records every conflict,
// settled by its policy, in conflicts(); a conflict never raises.
class PropertyMergeTool : public IMergeTool {
 public:
  explicit PropertyMergeTool(ConflictPolicy policy = ConflictPolicy::PreferTheirs);
  ~PropertyMergeTool() override;

  // The first delta, with every element of the second and third settled into it.
  // REQUIRES: three live deltas as a three-way comparison makes them ("ElementRequired").
  Delta run(const Commit& ancestor, const Commit& ours, const Commit& theirs,
            const std::vector<Delta>& deltas) const override;

  ConflictPolicy policy() const { return policy_; }
  // In the order they were met: per element in UUID order, then the repairs.
  const std::vector<MergeConflict>& conflicts() const { return conflicts_; }
  void clearConflicts() { conflicts_.clear(); }

 private:
  ConflictPolicy policy_;
  mutable std::vector<MergeConflict> conflicts_;
};

}  // namespace kiv
