#include "history/snapshot_states.h"

#include "history/history_support.h"
#include "kiv/history/kept_snapshot_states.h"
#include "kiv/metamodel/commit_impl.h"
#include "kiv/metamodel/delta_impl.h"

#include <cstdint>
#include <limits>
#include <optional>
#include <vector>

namespace kiv::history {

namespace {

const int kAttachmentKey = 0;

using qf::zero::Uuid;

// One delta's entries for one element; ages count from the line's oldest delta, 0.
struct Entry {
  std::size_t age;
  ObjectStorage before, after;
};

// The outcome of composing a line of `length` deltas for one element with these entries,
// step for step as the composition takes them: at step i the "after" of the delta i places
// from the newest, then the "before" of the delta i places from the oldest.
std::pair<ObjectStorage, ObjectStorage> replay(const std::vector<Entry>& entries, std::size_t length) {
  constexpr std::size_t kNone = std::numeric_limits<std::size_t>::max();
  std::size_t newestDeletion = kNone;  // an age
  std::size_t oldestCreation = kNone;
  for (const Entry& entry : entries) {
    if (entry.before && !entry.after) newestDeletion = entry.age;
    if (entry.after && !entry.before && oldestCreation == kNone) oldestCreation = entry.age;
  }
  const auto isAfter = [&](const Entry& entry) {
    return entry.after && (newestDeletion == kNone || entry.age > newestDeletion);
  };
  const auto isBefore = [&](const Entry& entry) {
    return entry.before && (oldestCreation == kNone || entry.age < oldestCreation);
  };
  // The afters are taken newest first, from the back; the befores oldest first.
  std::size_t afters = entries.size();  // one past the next after to take
  std::size_t befores = 0;              // the next before to take
  const auto nextAfter = [&] {
    while (afters > 0 && !isAfter(entries[afters - 1])) --afters;
  };
  const auto nextBefore = [&] {
    while (befores < entries.size() && !isBefore(entries[befores])) ++befores;
  };
  nextAfter();
  nextBefore();
  ObjectStorage current, previous;
  while (afters > 0 || befores < entries.size()) {
    const std::size_t afterStep = afters > 0 ? length - 1 - entries[afters - 1].age : kNone;
    const std::size_t beforeStep = befores < entries.size() ? entries[befores].age : kNone;
    if (afterStep <= beforeStep) {
      if (!current) current = entries[afters - 1].after;
      --afters;
      nextAfter();
    } else {
      if (!previous) {
        if (current == entries[befores].before) {
          current = ObjectStorage();
        } else {
          previous = entries[befores].before;
        }
      }
      ++befores;
      nextBefore();
    }
  }
  return {current, previous};
}

}  // namespace

struct SnapshotStates::LineState {
  struct Element {
    Uuid uuid;
    ObjectStorage newestAfter;  // null once a deletion is newer than every "after"
    bool created = false;
    std::vector<Entry> entries;  // only for an element with a "before" older than any creation
  };
  // Elements in the order the line first names them, found by UUID through their position
  // plus one: a state is copied at every checkpoint and read whole by every snapshot, so it
  // is kept in two arrays rather than a node per element.
  qf::zero::internal::FlatTable<Uuid, std::uint32_t> positions{qf::zero::internal::randomTableSeed()};
  std::vector<Element> elements;
  std::size_t length = 0;

  Element& elementOf(const Uuid& uuid) {
    if (const std::uint32_t* position = positions.find(uuid)) return elements[*position - 1];
    elements.push_back({uuid, {}, false, {}});
    positions.tryInsert(uuid, static_cast<std::uint32_t>(elements.size()));
    return elements.back();
  }

  // The next newer delta of the line; null for a commit that recorded nothing.
  void absorb(const Delta& delta) {
    const std::size_t age = length++;
    if (!isLive(delta)) return;
    const auto take = [&](const Uuid& uuid, const ObjectStorage& before, const ObjectStorage& after) {
      Element& element = elementOf(uuid);
      if (!element.entries.empty() || (before && !element.created))
        element.entries.push_back({age, before, after});
      if (after && !before) element.created = true;
      if (after) {
        element.newestAfter = after;
      } else {
        element.newestAfter = ObjectStorage();
      }
    };
    const StorageMap& befores = delta->getPrevious();
    const StorageMap& afters = delta->getCurrent();
    forEachPresent(afters, [&](const Uuid& uuid, const ObjectStorage& after) {
      take(uuid, presentEntry(befores, uuid), after);
    });
    forEachPresent(befores, [&](const Uuid& uuid, const ObjectStorage& before) {
      if (!presentEntry(afters, uuid)) take(uuid, before, ObjectStorage());
    });
  }

  ComposedState compose() const {
    ComposedState state;
    state.isSnapshot = true;
    state.current.reserve(elements.size());
    for (const Element& element : elements) {
      if (element.entries.empty()) {
        state.current.tryInsert(element.uuid, element.newestAfter);
        continue;
      }
      const auto [current, previous] = replay(element.entries, length);
      state.current.tryInsert(element.uuid, current);
      state.previous.tryInsert(element.uuid, previous);
    }
    return state;
  }
};

namespace {

// Whether every entry of the delta is a resident, live storage: a proxy may resolve later
// without any change to the delta, which a kept state would not notice.
bool allResident(const Delta& delta) {
  if (!isLive(delta)) return true;
  for (const StorageMap* map : {&delta->getPrevious(), &delta->getCurrent()}) {
    for (const auto& [key, held] : map->container()) {
      if (!held.isLive()) return false;
    }
  }
  return true;
}

}  // namespace

SnapshotStates& SnapshotStates::of(qf::zero::ModelImpl& model) {
  std::shared_ptr<void>& slot = model.attachment(&kAttachmentKey);
  if (!slot) slot = std::make_shared<SnapshotStates>();
  return *static_cast<SnapshotStates*>(slot.get());
}

void SnapshotStates::setEnabled(bool enabled) {
  enabled_ = enabled;
  states_.clear();
  recency_.clear();
}

std::shared_ptr<const SnapshotStates::LineState> SnapshotStates::kept(const Commit& commit) {
  const auto found = states_.find(commit.getImpl());
  if (found == states_.end()) return nullptr;
  recency_.splice(recency_.begin(), recency_, found->second.recency);
  return found->second.state;
}

void SnapshotStates::keep(const Commit& commit, std::shared_ptr<const LineState> state) {
  if (const auto found = states_.find(commit.getImpl()); found != states_.end()) {
    recency_.erase(found->second.recency);
    states_.erase(found);
  }
  if (states_.size() == kKeptStates) {
    states_.erase(recency_.back());
    recency_.pop_back();
  }
  recency_.push_front(commit.getImpl());
  states_.emplace(commit.getImpl(), Kept{commit, std::move(state), recency_.begin()});
}

ComposedState SnapshotStates::stateOf(const Commit& commit) {
  if (!enabled_) return snapshotStateComposed(commit);
  qf::zero::ModelImpl& model = *commit->getModelImpl();
  if (seenChanges_ != model.getWatchedChangeCount()) {
    states_.clear();
    recency_.clear();
  }

  // The line back to a kept state, or to where the snapshot's line ends.
  std::vector<Commit> line;
  std::shared_ptr<const LineState> base;
  for (Commit at = commit;;) {
    if ((base = kept(at))) break;
    const Delta delta = at->getDelta();
    if (!allResident(delta)) return snapshotStateComposed(commit);
    line.push_back(at);
    if (at->isInitial() || (isLive(delta) && delta->getIsSnapshot())) break;
    const auto& parents = at->getParents();
    const qf::zero::ModelElement parent = parents.basicAt(0);
    if (!parent.isLive()) return snapshotStateComposed(commit);
    at = qf::zero::elementCast<Commit>(parent);
  }

  if (line.empty()) {
    seenChanges_ = model.getWatchedChangeCount();
    return base->compose();
  }
  auto state = std::make_shared<LineState>(base ? *base : LineState());
  for (std::size_t back = line.size(); back-- > 0;) {
    const Commit& at = line[back];
    at->setWatched(true);
    const Delta delta = at->getDelta();
    if (isLive(delta)) delta->setWatched(true);
    state->absorb(delta);
    if (back != 0 && back % kCheckpointDistance == 0 && back <= 2 * kCheckpointDistance) {
      keep(at, std::make_shared<LineState>(*state));
    }
  }
  ComposedState composed = state->compose();
  keep(commit, std::move(state));
  seenChanges_ = model.getWatchedChangeCount();
  return composed;
}

}  // namespace kiv::history

namespace kiv {

void keepSnapshotStates(const qf::zero::Model& historyModel, bool keep) {
  history::SnapshotStates::of(*historyModel.getImpl()).setEnabled(keep);
}

}  // namespace kiv
