// The three-way comparison, one element at a time: each row gives what ours and theirs
// did to the element since the base and where each version must end up.
#include "../history/history_fixture.h"
#include "kiv/merge/merge3_strategy.h"

namespace {

using namespace history_test;

// What one side did to the element. SameAsOurs shares ours' very storage; EqualContent
// stores ours' content again, separately.
enum class Side { Absent, Same, Changed, Created, SameAsOurs, EqualContent };
// What the base knows of the element: its current entry, and the previous entry a
// snapshot may also carry for it.
enum class Base { Current, CurrentAndPrevious, None, PreviousOnly };

struct Diff3Case {
  std::string name;
  Base base;
  Side ours, theirs;
  // Each delta's entries for the element as "previous>current" by storage label ("b"
  // base, "p" base's previous, "o" ours, "t" theirs); "" for no entry at all.
  std::string merged, oursSide, theirsSide;
};

void PrintTo(const Diff3Case& row, std::ostream* out) { *out << row.name; }

class Diff3Table : public ::testing::TestWithParam<Diff3Case>, public HistoryModels {
 protected:
  kiv::Commit commitWith(const std::vector<kiv::Commit>& parents,
                         const std::function<void(kiv::Delta&)>& fill) {
    kiv::Commit commit = kiv::Commit::create(repository);
    for (const kiv::Commit& parent : parents) commit->addParent(parent);
    kiv::Delta delta = kiv::Delta::create(repository);
    fill(delta);
    commit->setDelta(delta);
    return commit;
  }

  // `own` is the side's own new version.
  void recordSide(kiv::Delta& delta, Side side, const kiv::ObjectStorage& own) {
    switch (side) {
      case Side::Absent:
        if (inBase()) delta->addDeleted(b_);
        break;
      case Side::Same:
        break;
      case Side::Changed:
      case Side::Created:
      case Side::SameAsOurs:
      case Side::EqualContent: {
        const kiv::ObjectStorage version = side == Side::SameAsOurs     ? o_
                                           : side == Side::EqualContent ? stored(a, "ours")
                                                                        : own;
        if (inBase()) {
          delta->addUpdated(b_, version);
        } else {
          delta->addCreated(version);
        }
        break;
      }
    }
  }

  bool inBase() const {
    return GetParam().base == Base::Current || GetParam().base == Base::CurrentAndPrevious;
  }

  std::string label(const kiv::ObjectStorage& storage) const {
    if (!storage) return "";
    if (storage == b_) return "b";
    if (storage == p_) return "p";
    if (storage == o_) return "o";
    return "t";  // theirs, or the copy of ours' content that stands for theirs
  }
  std::string entryOf(const kiv::Delta& delta) const {
    const std::string previous = label(delta->getPrevious(a)), current = label(delta->getCurrent(a));
    return previous.empty() && current.empty() ? "" : previous + ">" + current;
  }

  kiv::ObjectStorage b_ = stored(a, "base"), p_ = stored(a, "older"), o_ = stored(a, "ours"),
                     t_ = stored(a, "theirs");
};

TEST_P(Diff3Table, PutsEachVersionWhereTheRowSays) {
  const Diff3Case& row = GetParam();
  const kiv::Commit base = commitWith({}, [&](kiv::Delta& delta) {
    delta->setIsSnapshot(row.base == Base::CurrentAndPrevious || row.base == Base::PreviousOnly);
    if (row.base == Base::Current) delta->addCreated(b_);
    if (row.base == Base::CurrentAndPrevious) delta->addUpdated(p_, b_);
    if (row.base == Base::PreviousOnly) delta->addDeleted(p_);
    delta->addCreated(stored(c, "bystander"));
  });
  const kiv::Commit ours = commitWith({base}, [&](kiv::Delta& delta) { recordSide(delta, row.ours, o_); });
  const kiv::Commit theirs =
      commitWith({base}, [&](kiv::Delta& delta) { recordSide(delta, row.theirs, t_); });

  const std::vector<kiv::Delta> deltas = kiv::Merge3Strategy::diff3(base, ours, theirs);

  ASSERT_EQ(deltas.size(), 3u);
  EXPECT_TRUE(deltas[0].getIsSnapshot());
  EXPECT_FALSE(deltas[1].getIsSnapshot());
  EXPECT_EQ(entryOf(deltas[0]), row.merged);
  EXPECT_EQ(entryOf(deltas[1]), row.oursSide);
  EXPECT_EQ(entryOf(deltas[2]), row.theirsSide);
  // An element nobody touched is carried into the merged state as it is.
  EXPECT_TRUE(deltas[0]->isCreated(c));
}

using B = Base;
using S = Side;
INSTANTIATE_TEST_SUITE_P(
    Cases, Diff3Table,
    ::testing::Values(
        // Elements of the base.
        Diff3Case{"DeletedOnBothSides", B::Current, S::Absent, S::Absent, "b>", "", ""},
        Diff3Case{"DeletedByOursUnchangedByTheirs", B::Current, S::Absent, S::Same, "b>", "", ""},
        Diff3Case{"DeletedByOursChangedByTheirs", B::Current, S::Absent, S::Changed, "", "b>", "b>t"},
        Diff3Case{"UnchangedByOursDeletedByTheirs", B::Current, S::Same, S::Absent, "b>", "", ""},
        // Ours left it alone: theirs is taken unseen, as created without a previous entry.
        Diff3Case{"UnchangedOnBothSides", B::Current, S::Same, S::Same, ">b", "", ""},
        Diff3Case{"UnchangedByOursChangedByTheirs", B::Current, S::Same, S::Changed, ">t", "", ""},
        // ... and against the base's previous entry when the base has one.
        Diff3Case{"UnchangedOnBothSidesBaseWithPrevious", B::CurrentAndPrevious, S::Same, S::Same, "p>b", "",
                  ""},
        Diff3Case{"UnchangedByOursChangedByTheirsBaseWithPrevious", B::CurrentAndPrevious, S::Same,
                  S::Changed, "p>t", "", ""},
        Diff3Case{"ChangedByOursDeletedByTheirs", B::Current, S::Changed, S::Absent, "", "b>o", "b>"},
        Diff3Case{"ChangedByOursUnchangedByTheirs", B::Current, S::Changed, S::Same, "b>o", "", ""},
        Diff3Case{"ChangedToTheSameStorage", B::Current, S::Changed, S::SameAsOurs, "b>o", "", ""},
        Diff3Case{"ChangedDifferently", B::Current, S::Changed, S::Changed, "", "b>o", "b>t"},
        // Storages agree by identity only: equal content stored twice is a conflict.
        Diff3Case{"ChangedToEqualContentStoredTwice", B::Current, S::Changed, S::EqualContent, "", "b>o",
                  "b>t"},
        // Elements new since the base.
        Diff3Case{"CreatedByOursOnly", B::None, S::Created, S::Absent, ">o", "", ""},
        Diff3Case{"CreatedAsTheSameStorage", B::None, S::Created, S::SameAsOurs, ">o", "", ""},
        Diff3Case{"CreatedDifferently", B::None, S::Created, S::Created, "", ">o", ">t"},
        Diff3Case{"CreatedByTheirsOnly", B::None, S::Absent, S::Created, ">t", "", ""},
        // Theirs' new element is passed over when the base's previous entry knows it.
        Diff3Case{"CreatedByTheirsKnownToTheBasesPrevious", B::PreviousOnly, S::Absent, S::Created, "", "",
                  ""}),
    CaseName());

}  // namespace
