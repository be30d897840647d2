// The property merge tool's rules for one property of one element that both sides
// changed: each row gives the base, ours and theirs values and what the merge makes.
#include "../history/history_fixture.h"
#include "kiv/merge/merge3_strategy.h"
#include "kiv/merge/property_merge_tool.h"

namespace {

using namespace history_test;

struct RuleCase {
  std::string name;
  std::string property;  // of tm.Gadget
  JsonValue base, ours, theirs;
  JsonValue merged;
  bool conflict;
  kiv::ConflictPolicy policy = kiv::ConflictPolicy::PreferTheirs;
};

void PrintTo(const RuleCase& row, std::ostream* out) { *out << row.name; }

class PropertyMergeRules : public ::testing::TestWithParam<RuleCase>, public HistoryModels {
 protected:
  kiv::ObjectStorage gadget(const JsonValue& value) {
    JsonValue entry = {{"type", "tm.Gadget"}, {"id", qf::zero::toText(a)}, {"content", JsonValue::object()}};
    if (!value.is_null()) entry["content"][GetParam().property] = value;
    return kiv::ObjectStorage::Builder(repository).doSetElementUUID(a).doSetContent(entry).create();
  }
  kiv::Commit commitOf(const std::vector<kiv::Commit>& parents,
                       const std::function<void(kiv::Delta&)>& fill) {
    kiv::Commit commit = kiv::Commit::create(repository);
    for (const kiv::Commit& parent : parents) commit->addParent(parent);
    commit->setDelta(kiv::Delta::create(repository));
    kiv::Delta delta = commit->getDelta();
    fill(delta);
    return commit;
  }
};

TEST_P(PropertyMergeRules, MergeAsTheRowSays) {
  const RuleCase& row = GetParam();
  const kiv::ObjectStorage b = gadget(row.base);
  const kiv::Commit base = commitOf({}, [&](kiv::Delta& d) { d->addCreated(b); });
  const kiv::Commit ours = commitOf({base}, [&](kiv::Delta& d) { d->addUpdated(b, gadget(row.ours)); });
  const kiv::Commit theirs = commitOf({base}, [&](kiv::Delta& d) { d->addUpdated(b, gadget(row.theirs)); });
  auto tool = std::make_unique<kiv::PropertyMergeTool>(row.policy);
  const kiv::PropertyMergeTool& settled = *tool;
  const kiv::Merge3Strategy strategy(std::move(tool));
  const kiv::Commit merged = strategy.run(ours, theirs);

  const JsonValue entry = merged->getDelta()->getCurrent(a).getContent();
  EXPECT_EQ(entry["content"][row.property], row.merged) << entry.dump();
  ASSERT_EQ(settled.conflicts().size(), row.conflict ? 1u : 0u);
  if (row.conflict) {
    const kiv::MergeConflict& conflict = settled.conflicts().front();
    EXPECT_EQ(conflict.element, a);
    EXPECT_EQ(conflict.type, "tm.Gadget");
    EXPECT_EQ(conflict.property, row.property);
    EXPECT_EQ(conflict.kind, kiv::ConflictKind::BothChanged);
    EXPECT_EQ(conflict.base, row.base);
    EXPECT_EQ(conflict.ours, row.ours);
    EXPECT_EQ(conflict.theirs, row.theirs);
    EXPECT_EQ(conflict.merged, row.merged);
    EXPECT_EQ(conflict.chosen, row.policy == kiv::ConflictPolicy::PreferTheirs ? kiv::MergeSide::Theirs
                                                                               : kiv::MergeSide::Ours);
  }
}

const JsonValue None;
JsonValue list(std::initializer_list<JsonValue> items) {
  JsonValue array = JsonValue::array();
  for (const JsonValue& item : items) array.push_back(item);
  return array;
}

INSTANTIATE_TEST_SUITE_P(
    Rows, PropertyMergeRules,
    ::testing::Values(
        // Single values.
        RuleCase{"SingleChangedByOurs", "count", 7, 8, 7, 8, false},
        RuleCase{"SingleChangedByTheirs", "count", 7, 7, 9, 9, false},
        RuleCase{"SingleChangedAlike", "count", 7, 8, 8, 8, false},
        RuleCase{"SingleChangedDifferentlyTakesTheirs", "count", 7, 8, 9, 9, true},
        RuleCase{"SingleChangedDifferentlyTakesOursWhenPreferred", "count", 7, 8, 9, 8, true,
                 kiv::ConflictPolicy::PreferOurs},
        RuleCase{"JsonValueChangedDifferently", "note", JsonValue{{"n", 1}}, JsonValue{{"n", 2}},
                 JsonValue{{"n", 3}}, JsonValue{{"n", 3}}, true},
        RuleCase{"SingleSetOnOneSideOnly", "born", None, "2020-01-02T00:00:00", None, "2020-01-02T00:00:00",
                 false},
        // Sets: every addition and removal applies.
        RuleCase{"SetAdditionsAndRemovalsOfBothSides", "tags", list({"a", "b"}), list({"a", "b", "c"}),
                 list({"b", "d"}), list({"b", "c", "d"}), false},
        RuleCase{"SetSameAdditionOnBothSides", "tags", list({}), list({"x"}), list({"x"}), list({"x"}),
                 false},
        RuleCase{"SetRemovedOnOneSideAddedOnTheOther", "tags", list({"a"}), list({}), list({"a", "z"}),
                 list({"z"}), false},
        // Sequences: by identity, insertions kept after their predecessor.
        RuleCase{"SequenceInsertionsAtBothEnds", "scores", list({1, 2, 3}), list({0, 1, 2, 3}),
                 list({1, 2, 3, 4}), list({0, 1, 2, 3, 4}), false},
        RuleCase{"SequenceRemovalAndInsertion", "scores", list({1, 2, 3}), list({1, 3}), list({1, 2, 5, 3}),
                 list({1, 5, 3}), false},
        RuleCase{"SequenceReorderedByOneSideInsertedByTheOther", "scores", list({1, 2, 3}), list({3, 2, 1}),
                 list({1, 2, 3, 4}), list({3, 4, 2, 1}), false},
        RuleCase{"SequenceReorderedDifferentlyTakesTheirOrder", "scores", list({1, 2, 3}), list({3, 2, 1}),
                 list({2, 1, 3}), list({2, 1, 3}), true},
        RuleCase{"SequenceReorderedDifferentlyTakesOurOrderWhenPreferred", "scores", list({1, 2, 3}),
                 list({3, 2, 1}), list({2, 1, 3}), list({3, 2, 1}), true, kiv::ConflictPolicy::PreferOurs},
        // Both inserted at one place: the preferred side's insertion comes first.
        RuleCase{"SequenceInsertionsAtOnePlace", "scores", list({1, 2}), list({1, 8, 2}), list({1, 9, 2}),
                 list({1, 9, 8, 2}), false},
        RuleCase{"SequenceInsertionsAtOnePlaceOursFirstWhenPreferred", "scores", list({1, 2}),
                 list({1, 8, 2}), list({1, 9, 2}), list({1, 8, 9, 2}), false,
                 kiv::ConflictPolicy::PreferOurs},
        // Equal values count by occurrence: theirs removed the second 1, ours added a third.
        RuleCase{"SequenceRepeatedValues", "scores", list({1, 1}), list({1, 1, 1}), list({1}), list({1, 1}),
                 false},
        RuleCase{"SequenceSameInsertionOnBothSides", "scores", list({1}), list({1, 5}), list({1, 5}),
                 list({1, 5}), false}),
    CaseName());

}  // namespace
