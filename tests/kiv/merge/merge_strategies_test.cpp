// Ancestors, the strategies that merge through them, and a merge that fails half-way.
#include "../history/history_fixture.h"
#include "kiv/merge/accept_theirs_merge_strategy.h"
#include "kiv/merge/accept_theirs_merge_tool.h"
#include "kiv/merge/default_merge_strategy.h"
#include "kiv/merge/merge3_strategy.h"
#include "kiv/merge/recursive_merge3_strategy.h"
#include "kiv/metamodel/branch_impl.h"
#include "qf/zero/core/query.h"

namespace {

using namespace history_test;
using kiv::Commit;
using kiv::Merge3Strategy;

class MergeGraph : public HistoryTest {
 protected:
  // A commit whose delta records one new element, so that every commit changes the state.
  Commit commitOn(const std::vector<Commit>& parents) {
    Commit commit = Commit::create(repository);
    for (const Commit& parent : parents) commit->addParent(parent);
    commit->setDelta(kiv::Delta::create(repository));
    commit->getDelta()->addCreated(stored(qf::zero::generateNewUuid(), "made"));
    return commit;
  }
  std::size_t count(const qf::zero::meta::Class& type) const {
    return repository->getInstances(type, qf::zero::query::SearchClassMatchMode::ExactClass).size();
  }
  std::size_t commits() const { return count(kiv::MetaPackageKiv::getInstance().getCommit()); }
  std::size_t deltas() const { return count(kiv::MetaPackageKiv::getInstance().getDelta()); }

  Commit root = commitOn({});
};

TEST_F(MergeGraph, IntersectPathsIsTheCommonPrefixOfPathsThatStartAlike) {
  const Commit x = commitOn({root}), y = commitOn({x}), z = commitOn({x});
  using Path = Merge3Strategy::Path;
  EXPECT_EQ(Merge3Strategy::intersectPaths({root, x, y}, {root, x, z}), (Path{root, x}));
  EXPECT_EQ(Merge3Strategy::intersectPaths({root, x}, {root, x, z}), (Path{root, x}));
  EXPECT_TRUE(Merge3Strategy::intersectPaths({x, y}, {root, x, y}).empty());
  EXPECT_TRUE(Merge3Strategy::intersectPaths({}, {root}).empty());
}

TEST_F(MergeGraph, TheAncestorOfTwoCommitsOnOneLineIsTheOlder) {
  const Commit older = commitOn({root}), newer = commitOn({commitOn({older})});
  EXPECT_EQ(Merge3Strategy::findLCA(older, newer), std::vector<Commit>{older});
  EXPECT_EQ(Merge3Strategy::findLCA(newer, older), std::vector<Commit>{older});
  EXPECT_EQ(Merge3Strategy::findLCA(newer, newer), std::vector<Commit>{newer});
}

TEST_F(MergeGraph, TheAncestorOfTwoLinesIsWhereTheyFork) {
  const Commit fork = commitOn({root});
  const Commit ours = commitOn({commitOn({fork})}), theirs = commitOn({fork});
  EXPECT_EQ(Merge3Strategy::findLCA(ours, theirs), std::vector<Commit>{fork});
  // A merge of theirs into ours moves the fork point up to theirs.
  const Commit merged = commitOn({ours, theirs});
  EXPECT_EQ(Merge3Strategy::findLCA(merged, commitOn({theirs})), std::vector<Commit>{theirs});
}

TEST_F(MergeGraph, UnrelatedHistoriesHaveNoAncestor) {
  const Commit other = commitOn({});
  EXPECT_TRUE(Merge3Strategy::findLCA(commitOn({root}), commitOn({other})).empty());
  Merge3Strategy strategy(std::make_unique<kiv::AcceptTheirsMergeTool>());
  EXPECT_THROW(strategy.run(root, other), Exception<kiv::messages::NoUniqueLCA>);
}

// Two lines that each merged the other: two equally long common prefixes.
TEST_F(MergeGraph, CrissCrossHasTwoAncestorsAndOnlyTheRecursiveStrategyMergesIt) {
  const Commit a1 = commitOn({root}), b1 = commitOn({root});
  const Commit a2 = commitOn({a1, b1}), b2 = commitOn({b1, a1});
  EXPECT_EQ(Merge3Strategy::findLCA(a2, b2), (std::vector<Commit>{a1, b1}));
  Merge3Strategy plain(std::make_unique<kiv::AcceptTheirsMergeTool>());
  EXPECT_THROW(plain.run(a2, b2), Exception<kiv::messages::NoUniqueLCA>);

  const std::size_t commitsBefore = commits(), deltasBefore = deltas();
  const Commit merged =
      kiv::RecursiveMerge3Strategy(std::make_unique<kiv::AcceptTheirsMergeTool>()).run(a2, b2);
  EXPECT_TRUE(merged->isInitial()) << "the caller links the result into the graph";
  // The inner merge of a1 and b1 stays as the base, with both merges' unused deltas.
  EXPECT_EQ(commits(), commitsBefore + 2);
  EXPECT_EQ(deltas(), deltasBefore + 6);
  const kiv::Delta snapshot = merged->getSnapshot();
  for (const Commit& side : {a2, b2}) {
    const Uuid made = side->getDelta().getCurrent().container().begin()->first;
    EXPECT_TRUE(snapshot->getCurrent(made)) << "both sides' own elements are merged in";
  }
}

// c is reached along two (then three) equally long paths of the other commit.
TEST_F(MergeGraph, TwoEqualCandidatesFoldToOneButThreeDoNot) {
  const Commit c = commitOn({root});
  const Commit x = commitOn({c}), y = commitOn({c}), z = commitOn({c});
  EXPECT_EQ(Merge3Strategy::findLCA(c, commitOn({x, y})), std::vector<Commit>{c});
  // Three paths of differing lengths, each sharing [root, c] with the path of c.
  const Commit threeWays = commitOn({commitOn({x, y}), z});
  EXPECT_EQ(Merge3Strategy::findLCA(c, threeWays), (std::vector<Commit>{c, c, c}));
  Merge3Strategy plain(std::make_unique<kiv::AcceptTheirsMergeTool>());
  EXPECT_THROW(plain.run(commitOn({c}), threeWays), Exception<kiv::messages::NoUniqueLCA>);
  // Four equally long paths: the commit is its own ancestor four times over.
  const Commit fourWays = commitOn({commitOn({x, y}), commitOn({y, z})});
  EXPECT_EQ(Merge3Strategy::findLCA(fourWays, fourWays),
            (std::vector<Commit>{fourWays, fourWays, fourWays, fourWays}));
  // The recursive strategy takes the commit itself as the base instead of merging it
  // with itself, which would ask the same question again without end.
  const Commit merged =
      kiv::RecursiveMerge3Strategy(std::make_unique<kiv::AcceptTheirsMergeTool>()).run(fourWays, fourWays);
  EXPECT_TRUE(merged->getDelta()->getIsSnapshot());
}

TEST_F(MergeGraph, UnrelatedHistoriesMergeAgainstAnEmptyBaseThatDoesNotStay) {
  const Commit ours = commitOn({root}), theirs = commitOn({commitOn({})});
  const std::size_t commitsBefore = commits(), deltasBefore = deltas();
  const Commit merged =
      kiv::RecursiveMerge3Strategy(std::make_unique<kiv::AcceptTheirsMergeTool>()).run(ours, theirs);
  EXPECT_EQ(commits(), commitsBefore + 1);
  EXPECT_EQ(deltas(), deltasBefore + 3) << "the three deltas of the comparison";
  const kiv::Delta result = merged->getDelta();
  EXPECT_EQ(result.getCurrent().size(), 4u);
  EXPECT_EQ(result.getPrevious().size(), 0u) << "everything is created";
}

TEST_F(MergeGraph, AcceptTheirsStrategyRecordsTheirSnapshot) {
  const Commit ours = commitOn({root}), theirs = commitOn({commitOn({root})});
  const Commit merged = kiv::AcceptTheirsMergeStrategy().run(ours, theirs);
  EXPECT_EQ(currentOf(merged->getDelta()), currentOf(theirs->getSnapshot()));
  EXPECT_TRUE(merged->getDelta().getIsSnapshot());
}

TEST_F(MergeGraph, TheDefaultStrategyIsRecursiveWithTheAcceptTheirsTool) {
  const std::shared_ptr<kiv::IMergeStrategy> strategy = kiv::makeDefaultMergeStrategy();
  const auto* recursive = dynamic_cast<const kiv::RecursiveMerge3Strategy*>(strategy.get());
  ASSERT_NE(recursive, nullptr);
  EXPECT_NE(dynamic_cast<const kiv::AcceptTheirsMergeTool*>(&recursive->tool()), nullptr);
}

TEST(MergeStrategies, RefuseToBeMadeWithoutATool) {
  EXPECT_THROW(Merge3Strategy(nullptr), Exception<qf0::messages::ElementRequired>);
  EXPECT_THROW(kiv::RecursiveMerge3Strategy(nullptr), Exception<qf0::messages::ElementRequired>);
}

// Fails after it has changed the merged delta and made a storage of its own.
class ToolThatFailsHalfWay : public kiv::IMergeTool {
 public:
  kiv::Delta run(const Commit& ancestor, const Commit&, const Commit&,
                 const std::vector<kiv::Delta>& deltas) const override {
    deltas[0]->addCreated(storageOf(ancestor.getModel(), qf::zero::generateNewUuid(), "extra"));
    qf::zero::reportException(qf0::messages::InvalidValue());
    return deltas[0];
  }
};

// Makes its commit, then fails.
class StrategyThatFailsHalfWay : public kiv::IMergeStrategy {
 public:
  Commit run(const Commit& ours, const Commit&) const override {
    Commit::create(ours.getModel())->setDelta(kiv::Delta::create(ours.getModel()));
    qf::zero::reportException(qf0::messages::InvalidValue());
    return {};
  }
};

TEST_F(MergeGraph, AMergeThatFailsHalfWayLeavesTheRepositoryAsItWas) {
  const kiv::Branch ours = kiv::Branch::create(repository), theirs = kiv::Branch::create(repository);
  ours->commit(commitOn({root}));
  theirs->commit(commitOn({root}));
  const std::string before = support::dumpModel(repository);
  EXPECT_THROW(ours->merge(theirs, kiv::RecursiveMerge3Strategy(std::make_unique<ToolThatFailsHalfWay>())),
               Exception<qf0::messages::InvalidValue>);
  EXPECT_EQ(support::dumpModel(repository), before);
  EXPECT_THROW(ours->merge(theirs, StrategyThatFailsHalfWay()), Exception<qf0::messages::InvalidValue>);
  EXPECT_EQ(support::dumpModel(repository), before);
  ours->merge(theirs, *kiv::makeDefaultMergeStrategy());
  EXPECT_NE(support::dumpModel(repository), before);
  EXPECT_EQ(ours.getTip()->getParents().size(), 2u);
}

}  // namespace
