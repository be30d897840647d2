#include "merge/state_repairs.h"

#include "qf/zero/core/uuid.h"

#include <nlohmann/json.hpp>

#include <algorithm>
#include <deque>
#include <set>

namespace kiv::merge {

namespace {

using qf::zero::JsonValue;
using qf::zero::Uuid;

constexpr int kVisitsPerElement = 8;
constexpr int kRounds = 8;

bool names(const JsonValue& value, const Uuid& uuid) {
  const std::vector<Uuid> targets = referencedBy(value);
  return std::find(targets.begin(), targets.end(), uuid) != targets.end();
}

JsonValue memberOf(const JsonValue& entry, const std::string& name) {
  const JsonValue& content = contentOf(entry);
  const auto it = content.find(name);
  return it != content.end() ? *it : JsonValue();
}

// `value` with `uuid` added: set as the single value, kept sorted in a set, appended to
// a sequence.
JsonValue withTarget(const JsonValue& value, const Uuid& uuid, Shape shape) {
  const std::string text = qf::zero::toText(uuid);
  if (shape == Shape::Single) return text;
  JsonValue items = value.is_array() ? value : JsonValue::array();
  items.push_back(text);
  if (shape == Shape::Set) std::sort(items.begin(), items.end());
  return items;
}

JsonValue withoutTarget(const JsonValue& value, const Uuid& uuid) {
  if (!value.is_array()) return names(value, uuid) ? JsonValue() : value;
  JsonValue items = JsonValue::array();
  for (const JsonValue& item : value) {
    if (!names(item, uuid)) items.push_back(item);
  }
  return items;
}

class Repairs {
 public:
  Repairs(MergedState& state, EntrySchemas& schemas, RepairLog& log)
      : state_(state), schemas_(schemas), log_(log) {}

  void run() {
    std::vector<Uuid> pending = state_.changed();
    for (int round = 0; round < kRounds && !pending.empty(); ++round) {
      for (const Uuid& uuid : pending) queue(uuid);
      drain();
      pending = breakCycles();
    }
  }

 private:
  void queue(const Uuid& uuid) {
    if (visits_[uuid] < kVisitsPerElement) work_.push_back(uuid);
  }

  void drain() {
    while (!work_.empty()) {
      const Uuid uuid = work_.front();
      work_.pop_front();
      if (++visits_[uuid] > kVisitsPerElement) continue;
      const JsonValue* found = state_.find(uuid);
      if (found == nullptr || !schemas_.of(*found).hasReferences) continue;
      const JsonValue entry = *found;  // the repairs below may rewrite it
      for (const PropertySchema& property : schemas_.of(entry).properties) {
        if (!property.reference) continue;
        for (const Uuid& target : referencedBy(memberOf(entry, property.name))) {
          keepIfDeleted(target);
          if (!property.opposite.empty()) agree(uuid, property, target);
        }
      }
    }
  }

  // An element the merge deleted comes back as it was, since a merged element names it.
  void keepIfDeleted(const Uuid& target) {
    if (!state_.isDeleted(target)) return;
    JsonValue kept = state_.deletedEntry(target);
    log_.record(target, kept, {}, ConflictKind::KeptReferenced, JsonValue(), kept);
    state_.put(target, std::move(kept));
    queue(target);
  }

  // `owner`'s `property` names `target`; the opposite end on `target` must name `owner`.
  // A single end decides against a many end; otherwise the other end follows.
  void agree(const Uuid& owner, const PropertySchema& property, const Uuid& target) {
    const JsonValue* targetEntry = state_.find(target);
    if (targetEntry == nullptr) return;
    const JsonValue back = memberOf(*targetEntry, property.opposite);
    if (names(back, owner)) return;
    if (property.shape != Shape::Single && property.oppositeShape == Shape::Single) {
      rewrite(owner, property.name, [&](const JsonValue& value) { return withoutTarget(value, target); });
    } else {
      if (property.oppositeShape == Shape::Single) {
        for (const Uuid& displaced : referencedBy(back)) queue(displaced);
      }
      rewrite(target, property.opposite,
              [&](const JsonValue& value) { return withTarget(value, owner, property.oppositeShape); });
    }
  }

  template <class Change>
  void rewrite(const Uuid& uuid, const std::string& name, Change change) {
    const JsonValue* found = state_.find(uuid);
    if (found == nullptr) return;
    JsonValue entry = *found;
    JsonValue& member = contentOf(entry)[name];
    const JsonValue before = member;
    member = change(before);
    log_.record(uuid, entry, name, ConflictKind::OppositeEnd, before, member);
    state_.put(uuid, std::move(entry));
    queue(uuid);
  }

  // Walks up from each changed element through the ends that name a container. A cycle
  // is broken at its first element whose container is not the base's: that move is
  // undone. The elements to look at again are returned.
  std::vector<Uuid> breakCycles() {
    std::vector<Uuid> touched;
    for (const Uuid& start : state_.changed()) {
      std::vector<Uuid> chain{start};
      std::set<Uuid> onChain{start};
      for (Uuid at = start; const std::optional<Uuid> up = containerOf(at);) {
        if (*up == start) {
          undoMove(chain, touched);
          break;
        }
        if (!onChain.insert(*up).second) break;
        chain.push_back(*up);
        at = *up;
      }
    }
    return touched;
  }

  std::optional<Uuid> containerOf(const Uuid& uuid) {
    const JsonValue* entry = state_.find(uuid);
    if (entry == nullptr) return std::nullopt;
    const PropertySchema* end = containerEnd(*entry);
    if (end == nullptr) return std::nullopt;
    const std::vector<Uuid> container = referencedBy(memberOf(*entry, end->name));
    if (container.empty()) return std::nullopt;
    return container.front();
  }

  const PropertySchema* containerEnd(const JsonValue& entry) {
    for (const PropertySchema& property : schemas_.of(entry).properties) {
      if (property.containerEnd) return &property;
    }
    return nullptr;
  }

  void undoMove(const std::vector<Uuid>& cycle, std::vector<Uuid>& touched) {
    for (const Uuid& uuid : cycle) {
      const JsonValue entry = *state_.find(uuid);
      const PropertySchema* end = containerEnd(entry);
      const JsonValue* inBase = state_.findInBase(uuid);
      const JsonValue baseContainer = inBase != nullptr ? memberOf(*inBase, end->name) : JsonValue();
      if (memberOf(entry, end->name) == baseContainer) continue;
      JsonValue undone = entry;
      contentOf(undone)[end->name] = baseContainer;
      log_.record(uuid, entry, end->name, ConflictKind::ContainmentCycle, memberOf(entry, end->name),
                  baseContainer);
      state_.put(uuid, std::move(undone));
      visits_[uuid] = 0;
      touched.push_back(uuid);
      for (const Uuid& old : referencedBy(memberOf(entry, end->name))) {
        visits_[old] = 0;
        touched.push_back(old);
      }
      return;
    }
  }

  MergedState& state_;
  EntrySchemas& schemas_;
  RepairLog& log_;
  std::deque<Uuid> work_;
  std::map<Uuid, int> visits_;
};

}  // namespace

void RepairLog::record(const Uuid& element, const JsonValue& entry, const std::string& property,
                       ConflictKind kind, const JsonValue& before, const JsonValue& after) {
  const auto key = std::make_tuple(element, property, kind);
  if (const auto it = positions_.find(key); it != positions_.end()) {
    conflicts_[it->second].merged = after;
    return;
  }
  positions_.emplace(key, conflicts_.size());
  MergeConflict conflict;
  conflict.element = element;
  conflict.type = typeOf(entry);
  conflict.property = property;
  conflict.kind = kind;
  conflict.base = before;
  conflict.merged = after;
  conflict.chosen = MergeSide::Base;
  conflicts_.push_back(std::move(conflict));
}

void repairMergedState(MergedState& state, EntrySchemas& schemas, RepairLog& log) {
  Repairs(state, schemas, log).run();
}

}  // namespace kiv::merge
