#include "kiv/merge/property_merge_tool.h"

#include "history/composed_state.h"
#include "history/history_support.h"
#include "kiv/metamodel/commit_impl.h"
#include "kiv/metamodel/delta_impl.h"
#include "kiv/metamodel/object_storage_impl.h"
#include "merge/entry_schema.h"
#include "merge/merged_state.h"
#include "merge/state_repairs.h"
#include "merge/value_merge.h"

#include <set>

namespace kiv {

namespace {

using history::presentEntry;
using merge::EntrySchemas;
using merge::Shape;
using qf::zero::JsonValue;
using qf::zero::Uuid;

JsonValue memberOrNull(const JsonValue& content, const std::string& name) {
  const auto it = content.find(name);
  return it != content.end() ? *it : JsonValue();
}

// The names of both sides' members: theirs in their order, then any only ours has.
std::vector<std::string> memberNames(const JsonValue& ours, const JsonValue& theirs) {
  std::vector<std::string> names;
  for (const auto& member : theirs.items()) names.push_back(member.key());
  for (const auto& member : ours.items()) {
    if (!theirs.contains(member.key())) names.push_back(member.key());
  }
  return names;
}

class ElementSettler {
 public:
  ElementSettler(bool preferTheirs, EntrySchemas& schemas, std::vector<MergeConflict>& conflicts)
      : preferTheirs_(preferTheirs), schemas_(schemas), conflicts_(conflicts) {}

  // Both sides hold the element: property by property. `base` is null for an element
  // both sides made.
  JsonValue bothChanged(const Uuid& uuid, const JsonValue* base, const JsonValue& ours,
                        const JsonValue& theirs) {
    const JsonValue& preferred = preferTheirs_ ? theirs : ours;
    if (merge::typeOf(ours) != merge::typeOf(theirs)) {
      record(uuid, preferred, {}, ConflictKind::BothChanged, base ? *base : JsonValue(), ours, theirs,
             preferred);
      return preferred;
    }
    const merge::EntrySchema& schema = schemas_.of(theirs);
    const JsonValue noBase;
    const JsonValue& baseContent = merge::contentOf(base != nullptr ? *base : noBase);
    const JsonValue& ourContent = merge::contentOf(ours);
    const JsonValue& theirContent = merge::contentOf(theirs);
    JsonValue merged = preferred;
    JsonValue& content = merge::contentOf(merged);
    for (const std::string& name : memberNames(ourContent, theirContent)) {
      const JsonValue b = memberOrNull(baseContent, name), o = memberOrNull(ourContent, name),
                      t = memberOrNull(theirContent, name);
      const merge::PropertySchema* property = schema.find(name);
      const Shape shape = property != nullptr ? property->shape : Shape::Single;
      const merge::ValueMerge value = shape == Shape::Set ? merge::mergeSet(b, o, t)
                                      : shape == Shape::Sequence
                                          ? merge::mergeSequence(b, o, t, preferTheirs_)
                                          : merge::mergeSingle(b, o, t, preferTheirs_);
      if (value.conflict) record(uuid, theirs, name, ConflictKind::BothChanged, b, o, t, value.value);
      content[name] = value.value;
    }
    return merged;
  }

  // One side deleted the element, the other changed it: the change is kept.
  void deleteModify(const Uuid& uuid, const JsonValue& base, const JsonValue& ours, const JsonValue& theirs) {
    const JsonValue& kept = ours.is_null() ? theirs : ours;
    record(uuid, kept, {}, ConflictKind::DeleteModify, base, ours, theirs, kept,
           ours.is_null() ? MergeSide::Theirs : MergeSide::Ours);
  }

 private:
  void record(const Uuid& uuid, const JsonValue& entry, const std::string& property, ConflictKind kind,
              const JsonValue& base, const JsonValue& ours, const JsonValue& theirs,
              const JsonValue& merged) {
    record(uuid, entry, property, kind, base, ours, theirs, merged,
           preferTheirs_ ? MergeSide::Theirs : MergeSide::Ours);
  }
  void record(const Uuid& uuid, const JsonValue& entry, const std::string& property, ConflictKind kind,
              const JsonValue& base, const JsonValue& ours, const JsonValue& theirs, const JsonValue& merged,
              MergeSide chosen) {
    conflicts_.push_back(
        MergeConflict{uuid, merge::typeOf(entry), property, kind, base, ours, theirs, merged, chosen});
  }

  bool preferTheirs_;
  EntrySchemas& schemas_;
  std::vector<MergeConflict>& conflicts_;
};

JsonValue contentOrNull(const ObjectStorage& storage) { return storage ? storage.getContent() : JsonValue(); }

bool sameContent(const ObjectStorage& storage, const ObjectStorage& base) {
  return base && storage.getContent() == base.getContent();
}

}  // namespace

std::string_view toString(ConflictKind kind) {
  switch (kind) {
    case ConflictKind::BothChanged:
      return "BothChanged";
    case ConflictKind::DeleteModify:
      return "DeleteModify";
    case ConflictKind::KeptReferenced:
      return "KeptReferenced";
    case ConflictKind::OppositeEnd:
      return "OppositeEnd";
    case ConflictKind::ContainmentCycle:
      return "ContainmentCycle";
  }
  return "Unknown";
}

PropertyMergeTool::PropertyMergeTool(ConflictPolicy policy) : policy_(policy) {}

PropertyMergeTool::~PropertyMergeTool() = default;

// The base's snapshot tells the changed elements from the ones both sides left alone:
// only changed ones can name an element the merge deletes or disagree with an opposite.
Delta PropertyMergeTool::run(const Commit& ancestor, const Commit&, const Commit&,
                             const std::vector<Delta>& deltas) const {
  if (deltas.size() < 3 || !history::isLive(ancestor) ||
      !std::all_of(deltas.begin(), deltas.begin() + 3, [](const Delta& d) { return history::isLive(d); })) {
    qf::zero::reportException(qf0::messages::ElementRequired(u"kiv.PropertyMergeTool.run"));
  }
  Delta::Impl& merged = *deltas[0].getImpl();
  const Delta::Impl& ours = *deltas[1].getImpl();
  const Delta::Impl& theirs = *deltas[2].getImpl();
  qf::zero::Transaction transaction = history::beginTransactionOn(merged);
  const history::ComposedState baseState = history::snapshotState(ancestor);

  std::set<Uuid> open;
  const auto collect = [&](const Uuid& uuid, const ObjectStorage&) { open.insert(uuid); };
  for (const Delta::Impl* side : {&ours, &theirs}) {
    history::forEachPresent(side->getPrevious(), collect);
    history::forEachPresent(side->getCurrent(), collect);
  }

  std::vector<MergeConflict> found;
  EntrySchemas schemas;
  merge::MergedState state(merged, baseState.current);
  ElementSettler settler(policy_ == ConflictPolicy::PreferTheirs, schemas, found);
  for (const Uuid& uuid : open) {
    ObjectStorage base = presentEntry(ours.getPrevious(), uuid);
    if (!base) base = presentEntry(theirs.getPrevious(), uuid);
    const ObjectStorage o = presentEntry(ours.getCurrent(), uuid),
                        t = presentEntry(theirs.getCurrent(), uuid);
    if (o && t) {
      const JsonValue baseEntry = contentOrNull(base);
      state.put(uuid, settler.bothChanged(uuid, base ? &baseEntry : nullptr, o.getContent(), t.getContent()),
                {o, t});
    } else if (const ObjectStorage kept = o ? o : t; kept && !sameContent(kept, base)) {
      settler.deleteModify(uuid, contentOrNull(base), contentOrNull(o), contentOrNull(t));
      state.put(uuid, kept.getContent(), {kept});
    } else if (base && !presentEntry(merged.getPrevious(), uuid)) {
      // Deleted on one side; the other stored it again as it was (a transient property
      // changed, say), which changes nothing that a deletion would lose.
      merged.getPreviousMutable().add(base);
    }
  }
  merge::RepairLog log(found);
  merge::repairMergedState(state, schemas, log);
  state.write();
  transaction.commit();
  conflicts_.insert(conflicts_.end(), found.begin(), found.end());
  return deltas[0];
}

}  // namespace kiv
