// Merges of seeded random divergences: a base state of the test metamodel, then one to
// three commits of random edits on each side. Every property runs on 300 seeds; a failure
// names its seed.
#include "../history/history_fixture.h"
#include "kiv/history/kept_snapshot_states.h"
#include "kiv/merge/accept_theirs_merge_strategy.h"
#include "kiv/merge/accept_theirs_merge_tool.h"
#include "kiv/merge/merge3_strategy.h"
#include "kiv/merge/property_merge_tool.h"
#include "kiv/merge/recursive_merge3_strategy.h"
#include "support/random_editor.h"

#include <random>
#include <set>

namespace {

using namespace history_test;
using Entries = std::map<std::string, JsonValue>;

constexpr unsigned kSeeds = 300;
const char* const kReferences[] = {"children", "parent", "friends", "best", "index"};

struct Divergence {
  kiv::Commit base, ours, theirs;
  Entries baseState, ourState, theirState;
  JsonValue ourDocument;
};

// Every property runs with snapshots starting from kept states and composed from every delta.
class MergeProperties : public ::testing::TestWithParam<bool>, public HistoryModels {
 protected:
  void SetUp() override { kiv::keepSnapshotStates(repository, GetParam()); }
  Divergence diverge(unsigned seed, int baseEdits, int sideEdits) {
    Divergence d;
    const Model user = Model::create();
    support::RandomEditor editor(tm, user, seed);
    d.base = record(repository, user, {}, [&] {
      for (int i = 0; i < baseEdits; ++i) editor.step();
    });
    const JsonValue baseDocument = support::serializeModel(user);
    d.baseState = support::entriesById(baseDocument);
    const auto side = [&](unsigned sideSeed, Entries& state, JsonValue* document) {
      const Model model = modelFromDocument(baseDocument);
      support::RandomEditor sideEditor(tm, model, sideSeed);
      kiv::Commit tip = d.base;
      for (unsigned commit = 0; commit < 1 + sideSeed % 3; ++commit) {
        const kiv::Commit next = record(repository, model, {tip}, [&] {
          for (int i = 0; i < sideEdits; ++i) sideEditor.step();
        });
        if (next) tip = next;
      }
      const JsonValue sideDocument = support::serializeModel(model);
      state = support::entriesById(sideDocument);
      if (document != nullptr) *document = sideDocument;
      return tip;
    };
    d.ours = side(seed * 7 + 1, d.ourState, &d.ourDocument);
    d.theirs = side(seed * 7 + 2, d.theirState, nullptr);
    return d;
  }

  // Applies the merged delta to the state at ours; false when applying meets two
  // elements with one key in a map (renames on both sides, which no rule here settles).
  static bool applyAtOurs(const Divergence& d, const kiv::Commit& merged, Entries& result) {
    const Model user = modelFromDocument(d.ourDocument);
    try {
      apply(merged->getDelta(), user);
    } catch (const Exception<qf0::messages::UniquenessConstraint>&) {
      return false;
    }
    result = stateOf(user);
    return true;
  }
};

std::set<std::string> changedBetween(const Entries& before, const Entries& after);

// The entries two states disagree on, for failure messages.
std::string differences(const Entries& actual, const Entries& expected) {
  std::string text;
  for (const std::string& id : changedBetween(expected, actual)) {
    text += "\n" + id + "\n  merged:   " + (actual.count(id) ? actual.at(id).dump() : "absent") +
            "\n  expected: " + (expected.count(id) ? expected.at(id).dump() : "absent");
  }
  return text;
}

std::set<std::string> changedBetween(const Entries& before, const Entries& after) {
  std::set<std::string> changed;
  for (const auto& [id, entry] : before) {
    const auto it = after.find(id);
    if (it == after.end() || it->second != entry) changed.insert(id);
  }
  for (const auto& [id, entry] : after) {
    if (before.count(id) == 0) changed.insert(id);
  }
  return changed;
}

// The elements whose stored state at `side` is not the base's storage: changed, in the
// sense in which a three-way comparison tells sides apart (by storage identity).
std::set<std::string> storedAgain(const kiv::Commit& base, const kiv::Commit& side) {
  const StorageMap before = currentOf(base->getSnapshot()), after = currentOf(side->getSnapshot());
  std::set<std::string> changed;
  for (const auto& [uuid, storage] : before) {
    const auto it = after.find(uuid);
    if (it == after.end() || it->second != storage) changed.insert(qf::zero::toText(uuid));
  }
  for (const auto& [uuid, storage] : after) {
    if (before.count(uuid) == 0) changed.insert(qf::zero::toText(uuid));
  }
  return changed;
}

std::set<std::string> referencedBy(const JsonValue& entry) {
  std::set<std::string> targets;
  for (const char* name : kReferences) {
    const JsonValue& value = entry["content"].contains(name) ? entry["content"][name] : JsonValue();
    if (value.is_string()) targets.insert(value.get<std::string>());
    if (value.is_array())
      for (const JsonValue& item : value) targets.insert(item.get<std::string>());
  }
  return targets;
}

// Disjoint: no element changed on both sides, and no element one side changed names an
// element the other side deleted.
bool disjoint(const Divergence& d, const std::set<std::string>& ours, const std::set<std::string>& theirs) {
  for (const std::string& id : ours) {
    if (theirs.count(id) != 0) return false;
  }
  const auto namesDeleted = [](const std::set<std::string>& changed, const Entries& state,
                               const Entries& otherState, const Entries& base) {
    for (const std::string& id : changed) {
      if (!state.count(id)) continue;
      for (const std::string& target : referencedBy(state.at(id))) {
        if (base.count(target) && !otherState.count(target)) return true;
      }
    }
    return false;
  };
  return !namesDeleted(ours, d.ourState, d.theirState, d.baseState) &&
         !namesDeleted(theirs, d.theirState, d.ourState, d.baseState);
}

struct StrategySetup {
  std::string name;
  std::function<std::unique_ptr<kiv::IMergeStrategy>()> make;
};

std::vector<StrategySetup> threeWaySetups() {
  return {
      {"Merge3/AcceptTheirs",
       [] { return std::make_unique<kiv::Merge3Strategy>(std::make_unique<kiv::AcceptTheirsMergeTool>()); }},
      {"Merge3/Property",
       [] { return std::make_unique<kiv::Merge3Strategy>(std::make_unique<kiv::PropertyMergeTool>()); }},
      {"Recursive/AcceptTheirs",
       [] {
         return std::make_unique<kiv::RecursiveMerge3Strategy>(
             std::make_unique<kiv::AcceptTheirsMergeTool>());
       }},
      {"Recursive/Property",
       [] {
         return std::make_unique<kiv::RecursiveMerge3Strategy>(
             std::make_unique<kiv::PropertyMergeTool>(kiv::ConflictPolicy::PreferOurs));
       }},
  };
}

TEST_P(MergeProperties, DisjointChangesOfBothSidesAllReachTheMergedState) {
  int checked = 0, keyClashes = 0;
  for (unsigned seed = 1; seed <= kSeeds; ++seed) {
    const Divergence d = diverge(seed, 20, 3);
    const std::set<std::string> ours = storedAgain(d.base, d.ours), theirs = storedAgain(d.base, d.theirs);
    if (!disjoint(d, ours, theirs)) continue;
    Entries expected = d.baseState;
    for (const auto& [changed, state] : {std::pair{&ours, &d.ourState}, std::pair{&theirs, &d.theirState}}) {
      for (const std::string& id : *changed) {
        if (state->count(id)) {
          expected[id] = state->at(id);
        } else {
          expected.erase(id);
        }
      }
    }
    ++checked;
    for (const StrategySetup& setup : threeWaySetups()) {
      SCOPED_TRACE("seed " + std::to_string(seed) + ", " + setup.name);
      const kiv::Commit merged = setup.make()->run(d.ours, d.theirs);
      Entries result;
      if (!applyAtOurs(d, merged, result)) {
        ++keyClashes;
        continue;
      }
      ASSERT_TRUE(result == expected) << differences(result, expected);
    }
  }
  EXPECT_GE(checked, 20) << "too few seeds gave disjoint changes";
  EXPECT_LE(keyClashes, 4 * 3);
}

TEST_P(MergeProperties, AcceptTheirsStrategyRecordsTheirStateWhateverOursHolds) {
  for (unsigned seed = 1; seed <= kSeeds; ++seed) {
    SCOPED_TRACE("seed " + std::to_string(seed));
    const Divergence d = diverge(seed, 10, 4);
    const kiv::Commit merged = kiv::AcceptTheirsMergeStrategy().run(d.ours, d.theirs);
    ASSERT_EQ(currentOf(merged->getDelta()), currentOf(d.theirs->getSnapshot()));
    const Model user = Model::create();
    apply(merged->getDelta(), user);
    ASSERT_EQ(stateOf(user), d.theirState);
  }
}

Entries mergedEntries(const kiv::Commit& merged) {
  Entries entries;
  for (const auto& [uuid, storage] : currentOf(merged->getDelta())) {
    entries.emplace(qf::zero::toText(uuid), storage.getContent());
  }
  return entries;
}

const JsonValue* find(const Entries& state, const std::string& id) {
  const auto it = state.find(id);
  return it != state.end() ? &it->second : nullptr;
}

JsonValue member(const JsonValue* entry, const std::string& name) {
  if (entry == nullptr || !entry->at("content").contains(name)) return {};
  return entry->at("content").at(name);
}

bool isSingleValued(const std::string& name) {
  return name != "tags" && name != "children" && name != "friends" && name != "index" && name != "scores";
}

// What the tool recorded, by kind.
struct Recorded {
  explicit Recorded(const std::vector<kiv::MergeConflict>& conflicts) {
    for (const kiv::MergeConflict& c : conflicts) {
      const std::string id = qf::zero::toText(c.element);
      switch (c.kind) {
        case kiv::ConflictKind::BothChanged:
          bothChanged.emplace(id, c.property);
          break;
        case kiv::ConflictKind::DeleteModify:
          deleteModify.insert(id);
          break;
        case kiv::ConflictKind::KeptReferenced:
          kept.insert(id);
          break;
        default:
          repaired.emplace(id, c.property);
      }
    }
  }
  bool repairedOrKept(const std::string& id, const std::string& property) const {
    return repaired.count({id, property}) != 0 || kept.count(id) != 0;
  }
  std::set<std::pair<std::string, std::string>> bothChanged, repaired;
  std::set<std::string> deleteModify, kept;
};

TEST_P(MergeProperties, ThePropertyToolKeepsEveryOneSidedChangeAndRecordsEachConflict) {
  int keyClashes = 0, conflicts = 0;
  for (unsigned seed = 1; seed <= kSeeds; ++seed) {
    const Divergence d = diverge(seed, 20, 6);
    const std::set<std::string> ourChanges = storedAgain(d.base, d.ours),
                                theirChanges = storedAgain(d.base, d.theirs);
    for (const kiv::ConflictPolicy policy :
         {kiv::ConflictPolicy::PreferTheirs, kiv::ConflictPolicy::PreferOurs}) {
      SCOPED_TRACE("seed " + std::to_string(seed) +
                   (policy == kiv::ConflictPolicy::PreferOurs ? ", ours preferred" : ", theirs preferred"));
      auto owned = std::make_unique<kiv::PropertyMergeTool>(policy);
      const kiv::PropertyMergeTool& tool = *owned;
      const kiv::Merge3Strategy strategy(std::move(owned));
      const kiv::Commit merged = strategy.run(d.ours, d.theirs);
      const Entries result = mergedEntries(merged);
      Entries applied;
      if (!applyAtOurs(d, merged, applied)) {
        ++keyClashes;
        continue;
      }
      // Whole: a model holds exactly what the merge recorded (a dangling reference, a
      // containment cycle or two disagreeing ends would not survive the round trip).
      ASSERT_TRUE(applied == result) << differences(applied, result);

      const Recorded recorded(tool.conflicts());
      conflicts += static_cast<int>(tool.conflicts().size());
      std::set<std::pair<std::string, std::string>> expectedBothChanged;
      std::set<std::string> expectedDeleteModify;
      for (const std::string& id : ourChanges) {
        const JsonValue *b = find(d.baseState, id), *o = find(d.ourState, id), *t = find(d.theirState, id);
        if (theirChanges.count(id) == 0 || (o == nullptr && t == nullptr)) continue;
        if (o == nullptr || t == nullptr) {
          const JsonValue* kept = o != nullptr ? o : t;
          if (b == nullptr || kept->at("content") != b->at("content")) expectedDeleteModify.insert(id);
          continue;
        }
        for (const auto& item : o->at("content").items()) {
          const JsonValue vb = member(b, item.key()), vo = item.value(), vt = member(t, item.key());
          if (isSingleValued(item.key()) && vo != vb && vt != vb && vo != vt) {
            expectedBothChanged.emplace(id, item.key());
          } else if (!isSingleValued(item.key()) && recorded.bothChanged.count({id, item.key()})) {
            EXPECT_TRUE(vo != vb && vt != vb && vo != vt) << id << " " << item.key();
            expectedBothChanged.emplace(id, item.key());
          }
        }
      }
      EXPECT_EQ(recorded.bothChanged, expectedBothChanged);
      EXPECT_EQ(recorded.deleteModify, expectedDeleteModify);

      // Every change that one side made alone is in the merged state, unless a repair
      // names it.
      for (const auto& [changes, state, otherChanges] :
           {std::tuple{&ourChanges, &d.ourState, &theirChanges},
            std::tuple{&theirChanges, &d.theirState, &ourChanges}}) {
        for (const std::string& id : *changes) {
          const JsonValue *b = find(d.baseState, id), *mine = find(*state, id), *now = find(result, id);
          if (otherChanges->count(id) != 0) {
            if (mine == nullptr || now == nullptr) continue;  // settled by the rules above
            const JsonValue* other = find(state == &d.ourState ? d.theirState : d.ourState, id);
            for (const auto& item : mine->at("content").items()) {
              if (item.value() == member(b, item.key()) || member(other, item.key()) != member(b, item.key()))
                continue;
              if (recorded.repairedOrKept(id, item.key())) continue;
              EXPECT_EQ(member(now, item.key()), item.value()) << id << " " << item.key();
            }
            continue;
          }
          if (mine == nullptr) {
            EXPECT_TRUE(now == nullptr || recorded.kept.count(id)) << id << " deleted on one side only";
            continue;
          }
          ASSERT_NE(now, nullptr) << id << " changed on one side only";
          for (const auto& item : mine->at("content").items()) {
            if (item.value() == member(b, item.key()) || recorded.repairedOrKept(id, item.key())) continue;
            EXPECT_EQ(member(now, item.key()), item.value()) << id << " " << item.key();
          }
        }
      }
    }
  }
  EXPECT_GT(conflicts, 100) << "the divergences overlap too rarely to test much";
  EXPECT_LE(keyClashes, 2 * 8);
}

INSTANTIATE_TEST_SUITE_P(Snapshots, MergeProperties, ::testing::Bool(), [](const auto& info) {
  return std::string(info.param ? "KeptStates" : "Composed");
});

}  // namespace
