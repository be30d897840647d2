#include "kiv/repository/repository_fixture.h"

namespace repository_test {
namespace {

class EditRoad : public ::testing::Test, public RepositoryModels {};

TEST_F(EditRoad, EachUserTransactionBecomesACommitOnTheHead) {
  Clone clone = cloneOrigin();
  ASSERT_TRUE(clone.workspace->canCommit());
  ModelElement a = addNode(clone, u"a");
  const kiv::Commit first = clone.tip();
  ASSERT_TRUE(first);
  EXPECT_EQ(clone.workspace->getContext(), first);
  rename(clone, a, u"b");
  EXPECT_EQ(clone.tip()->getParent(), first);
  EXPECT_TRUE(clone.workspace->canUndo());
  const State named = stateOf(clone.user);
  clone.workspace->undo();
  EXPECT_EQ(clone.tip(), first);
  EXPECT_NE(stateOf(clone.user), named);
  clone.workspace->redo();
  EXPECT_EQ(stateOf(clone.user), named);
}

TEST_F(EditRoad, BranchCheckoutMergeAndPush) {
  Clone clone = cloneOrigin();
  ModelElement a = addNode(clone, u"a");
  clone.workspace->branch(u"feature");
  addNode(clone, u"f");
  const State onFeature = stateOf(clone.user);
  clone.workspace->checkout(u"master");
  EXPECT_EQ(stateOf(clone.user).size(), 1u);
  rename(clone, a, u"a2");
  clone.workspace->merge(u"feature");
  EXPECT_EQ(stateOf(clone.user).size(), 2u);
  EXPECT_TRUE(clone.tip()->isMerge());
  std::future<void> pushed = clone.workspace->push(kiv::PushMode::TryPush);
  ASSERT_TRUE(finishes(pushed));
  pushed.get();
  EXPECT_TRUE(origin->isEquivalent(clone.repository));
  Clone other = cloneOrigin();
  EXPECT_EQ(stateOf(other.user), stateOf(clone.user));
  (void)onFeature;
}

}  // namespace
}  // namespace repository_test
