// Properties of the workspace on seeded random edit sequences: every state a user model
// had at a commit comes back through undo, redo, checkout and setContext.
#include "kiv/merge/property_merge_tool.h"
#include "kiv/merge/recursive_merge3_strategy.h"
#include "kiv/workspace/workspace_fixture.h"
#include "support/random_editor.h"

#include <algorithm>
#include <random>

namespace workspace_test {
namespace {

// Random edits on "master", then on "side" branched from it, then on "master" again with a
// snapshot and a merge of "side" among them; the recorder keeps the state of each commit.
// Whole-state commits must read as states, not as changes from nothing, in both directions.
class WorkspaceProperties : public ::testing::TestWithParam<unsigned>, public RepositoryModels {
 protected:
  void SetUp() override {
    SCOPED_TRACE("seed " + std::to_string(GetParam()));
    support::RandomEditor editor(tm, clone.user, GetParam());
    const auto edit = [&](int steps) {
      for (int step = 0; step < steps; ++step) {
        ASSERT_NO_FATAL_FAILURE(editor.step());
        ASSERT_EQ(clone.workspace->getContext(), clone.tip());
      }
    };
    ASSERT_NO_FATAL_FAILURE(edit(12));
    clone.workspace->branch(u"side");
    ASSERT_NO_FATAL_FAILURE(edit(10));
    clone.workspace->checkout(u"master");
    ASSERT_NO_FATAL_FAILURE(edit(3));
    clone.workspace->takeSnapshot();
    recorder.record();
    ASSERT_NO_FATAL_FAILURE(edit(3));
    // The property tool, because it leaves no two ends of a reference disagreeing: the
    // state it records is the one the user model takes.
    installStrategy(clone.repository, std::make_shared<kiv::RecursiveMerge3Strategy>(
                                          std::make_unique<kiv::PropertyMergeTool>()));
    clone.workspace->merge(u"side");
    ASSERT_TRUE(clone.tip()->isMerge());
    recorder.record();
    ASSERT_NO_FATAL_FAILURE(edit(2));
    recorder.recording = false;
    ASSERT_GE(recorder.states().size(), 12u) << "too few edits became commits";
  }

  // The head's tip is the context and the user model holds the state recorded for it.
  void expectAtTip(const std::string& where) {
    SCOPED_TRACE(where);
    ASSERT_EQ(clone.workspace->getContext(), clone.tip());
    ASSERT_EQ(stateOf(clone.user), recorder.at(clone.tip()));
  }

  Clone clone = cloneOrigin();
  StateRecorder recorder{clone};
};

TEST_P(WorkspaceProperties, UndoAndRedoWalkEachBranchThroughEveryRecordedState) {
  SCOPED_TRACE("seed " + std::to_string(GetParam()));
  for (const std::u16string branch : {u"side", u"master", u"side"}) {
    clone.workspace->checkout(branch);
    ASSERT_NO_FATAL_FAILURE(expectAtTip("checked out"));
    const kiv::Commit top = clone.tip();
    std::vector<kiv::Commit> line{top};
    while (clone.workspace->canUndo()) {
      clone.workspace->undo();
      line.push_back(clone.tip());
      ASSERT_NO_FATAL_FAILURE(expectAtTip("undo " + std::to_string(line.size() - 1)));
    }
    ASSERT_FALSE(clone.tip());
    ASSERT_TRUE(stateOf(clone.user).empty());
    while (clone.workspace->canRedo()) {
      clone.workspace->redo();
      line.pop_back();
      ASSERT_EQ(clone.tip(), line.back());
      ASSERT_NO_FATAL_FAILURE(expectAtTip("redo to " + std::to_string(line.size() - 1) + " undone"));
    }
    ASSERT_EQ(clone.tip(), top);
  }
}

// Targets in random order, the null commit among them: forwards, backwards, across the
// branches, to the empty model and from no context. BranchUpdate also moves the head.
TEST_P(WorkspaceProperties, SetContextToAnyRecordedCommitGivesItsState) {
  SCOPED_TRACE("seed " + std::to_string(GetParam()));
  std::mt19937 random(GetParam());
  std::vector<kiv::Commit> targets;
  for (const auto& [commit, state] : recorder.states()) targets.push_back(commit);
  targets.insert(targets.end(), 3, kiv::Commit());
  std::sort(targets.begin(), targets.end(), [](const kiv::Commit& a, const kiv::Commit& b) {
    return (a ? a.getUuid() : qf::zero::Uuid()) < (b ? b.getUuid() : qf::zero::Uuid());
  });
  std::shuffle(targets.begin(), targets.end(), random);
  for (std::size_t i = 0; i < targets.size(); ++i) {
    const kiv::Commit& target = targets[i];
    const bool moveHead = std::uniform_int_distribution<int>(0, 3)(random) == 0;
    SCOPED_TRACE("target " + std::to_string(i) + (moveHead ? " moving the head" : ""));
    const kiv::Commit from = clone.workspace->getContext();
    const kiv::Commit tip = clone.tip();
    clone.workspace->setContext(
        target, moveHead ? kiv::SetContextMode::BranchUpdate : kiv::SetContextMode::ContextOnly);
    ASSERT_EQ(clone.workspace->getContext(), target);
    ASSERT_EQ(stateOf(clone.user), recorder.at(target));
    if (target == from) {
      ASSERT_EQ(clone.tip(), tip) << "setting the context it already has moved the head";
    } else if (moveHead) {
      ASSERT_EQ(clone.tip(), target);
      ASSERT_FALSE(clone.workspace->canRedo());
    }
  }
  // Back at the head's tip, the next user transaction is a commit on it again.
  clone.workspace->updateContext();
  ASSERT_NO_FATAL_FAILURE(expectAtTip("updated"));
  const kiv::Commit before = clone.tip();
  addNode(clone, u"after");
  EXPECT_EQ(clone.tip()->getParent(), before);
}

INSTANTIATE_TEST_SUITE_P(Seeds, WorkspaceProperties, ::testing::Range(1u, 21u));

}  // namespace
}  // namespace workspace_test
