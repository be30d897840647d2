// Properties of recorded histories: seeded random edits of a small user model, recorded
// as commits on branching lines with hand-built merge commits.
#include "history_fixture.h"
#include "kiv/history/kept_snapshot_states.h"
#include "kiv/history/state_difference.h"
#include "kiv/metamodel/branch_impl.h"
#include "support/random_editor.h"

#include <random>
#include <tuple>

namespace {

using namespace history_test;

// Each commit continues one of the last few commits (so lines grow long), and about
// one in five also merges another commit as its second parent. A merge's delta is
// recorded from its first parent's state, as a merge commit's is.
class RandomHistory {
 public:
  explicit RandomHistory(unsigned seed) : random_(seed) {}

  void grow(int count, int editsPerCommit) {
    for (int n = 0; n < count; ++n) {
      std::vector<kiv::Commit> parents;
      std::size_t base = 0;
      if (!commits_.empty()) {
        base = pickRecent();
        parents.push_back(commits_[base]);
        const std::size_t other = pickAny();
        if (chance(5) && other != base) parents.push_back(commits_[other]);
      }
      Model user = commits_.empty() ? Model::create() : modelFromDocument(states_[base]);
      support::RandomEditor editor(tm_, user, static_cast<unsigned>(random_()));
      commits_.push_back(record(repository_, user, parents, [&] {
        for (int edit = 0; edit < editsPerCommit; ++edit) editor.step();
      }));
      states_.push_back(support::serializeModel(user));
    }
  }

  std::size_t size() const { return commits_.size(); }
  std::size_t indexOf(const kiv::Commit& commit) const {
    return static_cast<std::size_t>(std::find(commits_.begin(), commits_.end(), commit) - commits_.begin());
  }
  const kiv::Commit& commit(std::size_t i) const { return commits_[i]; }
  std::map<std::string, JsonValue> state(std::size_t i) const { return support::entriesById(states_[i]); }
  Model modelAt(std::size_t i) const { return modelFromDocument(states_[i]); }
  std::size_t pickAny() {
    return std::uniform_int_distribution<std::size_t>(0, commits_.size() - 1)(random_);
  }
  const Model& repository() const { return repository_; }

 private:
  std::size_t pickRecent() {
    const std::size_t window = std::min<std::size_t>(commits_.size(), 4);
    return commits_.size() - 1 - std::uniform_int_distribution<std::size_t>(0, window - 1)(random_);
  }
  bool chance(int oneIn) { return std::uniform_int_distribution<int>(0, oneIn - 1)(random_) == 0; }

  support::TestMetamodel tm_;
  Model repository_ = Model::create();
  std::mt19937 random_;
  std::vector<kiv::Commit> commits_;
  std::vector<JsonValue> states_;
};

// Each property runs on the history grown from each seed, with snapshots starting from
// kept states and composed from every delta.
class HistoryProperties : public ::testing::TestWithParam<std::tuple<unsigned, bool>> {
 protected:
  void SetUp() override {
    kiv::keepSnapshotStates(history.repository(), std::get<1>(GetParam()));
    history.grow(30, 4);
  }
  RandomHistory history{std::get<0>(GetParam())};
};

// A merge commit's delta runs from its first parent's state. A diff whose path reaches
// back through a later parent still composes that delta, and so misses what the first
// parent's line brought in: a known gap of diff across merges, left out of this property.
bool pathEntersALaterParent(const kiv::Commit& from, const kiv::Commit& to) {
  const std::vector<kiv::Commit> path = from->findPath(to);
  for (std::size_t i = 0; i + 1 < path.size(); ++i) {
    if (path[i]->getParent() != path[i + 1]) return true;
  }
  return false;
}

TEST_P(HistoryProperties, ApplyingADiffToTheStateAtItsBaseGivesTheStateAtItsTarget) {
  int keyTrades = 0;
  for (int sample = 0; sample < 60; ++sample) {
    const std::size_t a = history.pickAny();
    const std::size_t b = history.pickAny();
    if (a == b || pathEntersALaterParent(history.commit(a), history.commit(b))) continue;
    SCOPED_TRACE("diff of commit " + std::to_string(a) + " against commit " + std::to_string(b));
    const Model user = history.modelAt(b);
    const kiv::Delta diff = history.commit(a)->diff(history.commit(b));
    try {
      apply(diff, user);
    } catch (const Exception<qf0::messages::UniquenessConstraint>&) {
      // A known gap of applying, left out of this property: entries are applied one by
      // one, so two elements that trade keys of one map meet on a key half-way.
      ++keyTrades;
      continue;
    }
    ASSERT_EQ(stateOf(user), history.state(a));
  }
  EXPECT_LE(keyTrades, 3) << "applying refuses more than the rare trade of map keys";
}

// Unlike a diff, the difference of two states holds across merges, between unrelated
// commits and towards or from the empty state.
TEST_P(HistoryProperties, TheDifferenceOfTwoStatesTakesOneStateToTheOther) {
  for (int sample = 0; sample < 60; ++sample) {
    const std::size_t a = history.pickAny();
    const std::size_t b = history.pickAny();
    const bool fromEmpty = sample % 10 == 0;
    const bool toEmpty = sample % 10 == 5;
    SCOPED_TRACE("from commit " + std::to_string(a) + (fromEmpty ? " (empty)" : "") + " to commit " +
                 std::to_string(b) + (toEmpty ? " (empty)" : ""));
    const Model user = fromEmpty ? Model::create() : history.modelAt(a);
    const kiv::Delta difference = kiv::stateDifference(fromEmpty ? kiv::Commit() : history.commit(a),
                                                       toEmpty ? kiv::Commit() : history.commit(b));
    if (a == b && !fromEmpty && !toEmpty) {
      ASSERT_TRUE(difference->isEmpty());
    }
    try {
      apply(difference, user);
    } catch (const Exception<qf0::messages::UniquenessConstraint>&) {
      continue;  // two elements trading map keys, as above
    }
    if (toEmpty) {
      ASSERT_TRUE(stateOf(user).empty());
    } else {
      ASSERT_EQ(stateOf(user), history.state(b));
    }
  }
}

TEST_P(HistoryProperties, ASnapshotAppliedToAnEmptyModelGivesTheStateAtItsCommit) {
  for (std::size_t i = 0; i < history.size(); ++i) {
    SCOPED_TRACE("commit " + std::to_string(i));
    const kiv::Delta snapshot = history.commit(i)->getSnapshot();
    EXPECT_TRUE(snapshot.getIsSnapshot());
    const Model user = Model::create();
    apply(snapshot, user);
    ASSERT_EQ(stateOf(user), history.state(i));
  }
}

// Undo steps the user model back to each first parent's state; redoing everything
// returns the branch (tip and empty redo stack) and the model to where they were.
TEST_P(HistoryProperties, UndoThenRedoReturnsABranchAndItsModelToWhereTheyWere) {
  const std::size_t tipIndex = history.size() - 1;
  std::vector<kiv::Commit> line;  // first-parent line, tip first
  for (kiv::Commit c = history.commit(tipIndex); c; c = c->getParent()) line.push_back(c);
  const kiv::Branch branch = kiv::Branch::create(history.repository());
  for (auto it = line.rbegin(); it != line.rend(); ++it) branch->commit(*it);

  const Model user = history.modelAt(tipIndex);
  std::size_t undone = 0;
  while (branch->canUndo()) {
    apply(branch->undo(), user);
    ++undone;
    if (const kiv::Commit tip = branch.getTip()) {
      ASSERT_EQ(stateOf(user), history.state(history.indexOf(tip)));
    } else {
      ASSERT_TRUE(stateOf(user).empty());
    }
  }
  // Undo stops at a commit that recorded nothing (every edit of it was refused).
  const auto firstEmpty =
      std::find_if(line.begin(), line.end(), [](const kiv::Commit& c) { return c->isEmpty(); });
  EXPECT_EQ(undone, static_cast<std::size_t>(firstEmpty - line.begin()));
  EXPECT_FALSE(branch->isEmpty()) << "undone commits stay on the redo stack";
  while (branch->canRedo()) apply(branch->redo(), user);
  EXPECT_EQ(branch.getTip(), line.front());
  EXPECT_EQ(branch.getRedoStack().size(), 0u);
  EXPECT_EQ(stateOf(user), history.state(tipIndex));
}

INSTANTIATE_TEST_SUITE_P(Seeds, HistoryProperties,
                         ::testing::Combine(::testing::Values(7u, 1234u, 99991u), ::testing::Bool()),
                         [](const auto& info) {
                           return std::to_string(std::get<0>(info.param)) +
                                  (std::get<1>(info.param) ? "_KeptStates" : "_Composed");
                         });

}  // namespace
