// Walks over shaped commit graphs: paths, ancestry, selection by depth and by range.
#include "kiv/merge/accept_theirs_merge_tool.h"
#include "kiv/merge/lowest_common_ancestors.h"
#include "kiv/merge/merge3_strategy.h"
#include "kiv/merge/recursive_merge3_strategy.h"
#include "kiv/messages/messages.h"
#include "kiv/metamodel/commit_impl.h"
#include "qf/zero/core/model_impl.h"
#include "qf/zero/core/transaction.h"

#include <gtest/gtest.h>

#include <initializer_list>
#include <map>
#include <string>
#include <unordered_set>

namespace {

using Path = std::vector<kiv::Commit>;

// A commit graph whose commits are named by one letter; parents in order, first first.
class Graph {
 public:
  const kiv::Commit& add(char name, std::initializer_list<char> parents = {}) {
    kiv::Commit commit = kiv::Commit::create(model_);
    for (char parent : parents) commit->addParent(at(parent));
    names_[commit.getImpl()] = name;
    return commits_[name] = commit;
  }
  const kiv::Commit& at(char name) const { return commits_.at(name); }
  std::string spell(const Path& path) const {
    std::string text;
    for (const kiv::Commit& commit : path) text += names_.at(commit.getImpl());
    return text;
  }
  std::vector<std::string> spell(const std::vector<Path>& paths) const {
    std::vector<std::string> texts;
    for (const Path& path : paths) texts.push_back(spell(path));
    return texts;
  }
  std::string spell(const std::unordered_set<kiv::Commit>& commits) const {
    std::string text;
    for (const kiv::Commit& commit : commits) text += names_.at(commit.getImpl());
    std::sort(text.begin(), text.end());
    return text;
  }
  std::unordered_set<kiv::Commit> set(const std::string& names) const {
    std::unordered_set<kiv::Commit> commits;
    for (char name : names) commits.insert(at(name));
    return commits;
  }

 private:
  qf::zero::Model model_ = qf::zero::Model::create();
  std::map<char, kiv::Commit> commits_;
  std::map<const void*, char> names_;
};

// a - b ------- m      m merges c2, which continues c; c and b both start from a.
//  \           /
//   c ---- c2
class MergeOfASideLine : public ::testing::Test {
 protected:
  void SetUp() override {
    g.add('a');
    g.add('b', {'a'});
    g.add('c', {'a'});
    g.add('d', {'c'});
    g.add('m', {'b', 'd'});
  }
  Graph g;
};

TEST_F(MergeOfASideLine, APathToTheSecondParentsLineIsFoundAfterTheFirstParentLineEnds) {
  EXPECT_EQ(g.spell(g.at('m')->findPath(g.at('c'))), "mdc");
  EXPECT_EQ(g.spell(g.at('m')->findPath(g.at('b'))), "mb");
  EXPECT_EQ(g.spell(g.at('m')->findPathHelper([&](const kiv::Commit& c) { return c == g.at('c'); })),
            std::vector<std::string>{"mdc"})
      << "the path that ended at the initial commit before the match is dropped";
}

TEST_F(MergeOfASideLine, PathsAndAncestry) {
  EXPECT_EQ(g.spell(g.at('m')->findAllPaths()), (std::vector<std::string>{"mba", "mdca"}));
  EXPECT_EQ(g.spell(g.at('m')->findPath(g.at('m'))), "m") << "a commit is its own path";
  EXPECT_TRUE(g.at('m')->findPath(kiv::Commit()).empty());
  EXPECT_TRUE(g.at('b')->findPath(g.at('c')).empty()) << "c is on another line";
  EXPECT_TRUE(g.at('a')->isPredecessorOf(g.at('m')));
  EXPECT_TRUE(g.at('d')->isPredecessorOf(g.at('m')));
  EXPECT_TRUE(g.at('m')->isPredecessorOf(g.at('m')));
  EXPECT_FALSE(g.at('m')->isPredecessorOf(g.at('a')));
  EXPECT_FALSE(g.at('b')->isPredecessorOf(g.at('c')));
  EXPECT_FALSE(g.at('b')->isPredecessorOf(kiv::Commit()));
  EXPECT_EQ(g.at('m')->getParent(), g.at('b')) << "the first parent added";
  EXPECT_TRUE(g.at('m')->isMerge());
  EXPECT_FALSE(g.at('d')->isMerge());
}

TEST(CommitWalks, AnInitialCommitIsItsOnlyPath) {
  Graph g;
  const kiv::Commit& a = g.add('a');
  EXPECT_TRUE(a->isInitial());
  EXPECT_FALSE(a->getParent());
  EXPECT_EQ(g.spell(a->findAllPaths()), std::vector<std::string>{"a"});
  EXPECT_EQ(g.spell(a->findPath(a)), "a");
  EXPECT_TRUE(a->isPredecessorOf(a));
}

// The walk toward a target skips commits no taller than it; the depths it reads are kept,
// and a parent added later must not leave them stale.
TEST(CommitWalks, APathThatAParentAddedLaterOpensIsFound) {
  Graph g;
  g.add('a');
  g.add('b', {'a'});
  g.add('c');
  g.add('d', {'c'});
  EXPECT_TRUE(g.at('d')->findPath(g.at('a')).empty());
  EXPECT_EQ(g.spell(g.at('b')->findPath(g.at('a'))), "ba");
  g.at('c')->addParent(g.at('b'));
  EXPECT_EQ(g.spell(g.at('d')->findPath(g.at('a'))), "dcba");
  EXPECT_TRUE(g.at('a')->findPath(g.at('d')).empty());
}

// a - b - d - f      d merges c and e merges b: each of d, e reaches both b and c, so
//  \   X   /         f has four paths back to a, and without a visited set a, b and c
//   c - e            occur in several of them.
class CrissCross : public ::testing::Test {
 protected:
  void SetUp() override {
    g.add('a');
    g.add('b', {'a'});
    g.add('c', {'a'});
    g.add('d', {'b', 'c'});
    g.add('e', {'c', 'b'});
    g.add('f', {'d', 'e'});
  }
  Graph g;
};

TEST_F(CrissCross, EveryPathIsReportedInTheOrderItFinishes) {
  // The front path runs down first parents; side lines wait in arrival order.
  EXPECT_EQ(g.spell(g.at('f')->findAllPaths()), (std::vector<std::string>{"fdba", "feca", "fdca", "feba"}));
  // f-d-c waits behind f-e, which was queued first and reaches c through its first parent.
  EXPECT_EQ(g.spell(g.at('f')->findPath(g.at('c'))), "fec");
  EXPECT_EQ(g.spell(g.at('e')->findPath(g.at('b'))), "eb");
}

TEST_F(CrissCross, SelectTakesThePrefixesOfEveryPath) {
  std::unordered_set<kiv::Commit> out = g.set("a");
  kiv::Commit::Impl::select(g.set("f"), out, 0);
  EXPECT_EQ(g.spell(out), "a") << "depth 0 selects nothing";
  out.clear();
  kiv::Commit::Impl::select(g.set("de"), out, 1);
  EXPECT_EQ(g.spell(out), "de") << "depth 1 selects the commits themselves";
  out.clear();
  kiv::Commit::Impl::select(g.set("f"), out, 2);
  EXPECT_EQ(g.spell(out), "def");
  out.clear();
  kiv::Commit::Impl::select(g.set("f"), out, 3);
  EXPECT_EQ(g.spell(out), "bcdef");
  out.clear();
  kiv::Commit::Impl::select(g.set("fb"), out, -1);
  EXPECT_EQ(g.spell(out), "abcdef") << "a negative depth selects every ancestor";
}

TEST_F(CrissCross, SelectInRangeKeepsWhatOnlyTheNewEndReaches) {
  std::unordered_set<kiv::Commit> out;
  kiv::Commit::Impl::selectInRange(g.set("b"), g.set("f"), out);
  EXPECT_EQ(g.spell(out), "cdef");
  out.clear();
  kiv::Commit::Impl::selectInRange(g.set("de"), g.set("f"), out);
  EXPECT_EQ(g.spell(out), "f");
  out.clear();
  kiv::Commit::Impl::selectInRange(g.set("f"), g.set("d"), out);
  EXPECT_TRUE(out.empty()) << "everything d reaches, f reaches too";
  out.clear();
  kiv::Commit::Impl::selectInRange({}, g.set("b"), out);
  EXPECT_EQ(g.spell(out), "ab");
}

// Two lines that merge each other at every rung: x_i merges y_(i-1) into x_(i-1), y_i
// merges x_(i-1) into y_(i-1), with x_0 the start and y_0 its child. The tips reach the
// start along 2^rungs paths each, so a walk that took every path would not end; every walk
// a user's work asks for must.
class Ladder : public ::testing::Test {
 protected:
  static constexpr std::size_t kRungs = 64;
  void SetUp() override {
    xs.push_back(kiv::Commit::create(model));
    ys.push_back(kiv::Commit::create(model));
    ys[0]->addParent(xs[0]);
    for (std::size_t rung = 1; rung <= kRungs; ++rung) {
      kiv::Commit x = kiv::Commit::create(model), y = kiv::Commit::create(model);
      x->addParent(xs.back());
      x->addParent(ys.back());
      y->addParent(ys.back());
      y->addParent(xs.back());
      xs.push_back(x);
      ys.push_back(y);
    }
  }
  qf::zero::Model model = qf::zero::Model::create();
  std::vector<kiv::Commit> xs, ys;  // by rung
};

TEST_F(Ladder, PathsAndSelectionsEndOnAHistoryWithExponentiallyManyPaths) {
  const Path path = xs[kRungs]->findPath(xs[0]);
  EXPECT_TRUE(std::equal(path.begin(), path.end(), xs.rbegin(), xs.rend())) << "first parents all the way";
  EXPECT_TRUE(xs[kRungs]->findPath(ys[kRungs]).empty());
  EXPECT_EQ(ys[kRungs]->findPath(xs[0]).size(), kRungs + 2) << "down the y line, then to the start";

  std::unordered_set<kiv::Commit> selected;
  kiv::Commit::Impl::select({xs[kRungs]}, selected, 3);
  EXPECT_EQ(selected.size(), 1u + 2u + 2u) << "the tip, and the two commits of each of the two rungs below";
  selected.clear();
  kiv::Commit::Impl::select({xs[kRungs]}, selected, -1);
  EXPECT_EQ(selected.size(), 1u + 2u * kRungs);
  selected.clear();
  kiv::Commit::Impl::selectInRange({xs[kRungs - 2]}, {xs[kRungs], ys[kRungs]}, selected);
  EXPECT_EQ(selected.size(), 2u + 2u + 1u) << "the two rungs above x_(rungs-2), and its sibling";
}

TEST_F(Ladder, TheTipsHaveTwoLowestCommonAncestorsAndTheStrategiesSettleThatAsBefore) {
  // Both tips merge x_(rungs-1) and y_(rungs-1): a criss-cross at every rung. x's first path
  // that ends in the list leaves the x line at once for y_(rungs-1); the next leaves it one
  // step later, after x_(rungs-1).
  const kiv::merge::AncestorList ancestors =
      kiv::merge::summarizeLowestCommonAncestors(xs[kRungs], ys[kRungs]);
  EXPECT_FALSE(ancestors.isUnique());
  EXPECT_EQ(ancestors.length, 3u);
  EXPECT_EQ(ancestors.first, ys[kRungs - 1]);
  EXPECT_EQ(ancestors.second, xs[kRungs - 1]);

  const kiv::Merge3Strategy merge3(std::make_unique<kiv::AcceptTheirsMergeTool>());
  EXPECT_THROW(merge3.run(xs[kRungs], ys[kRungs]),
               foundation::core::except::Exception<kiv::messages::NoUniqueLCA>);

  // The recursive strategy merges the two ancestors, and theirs, down every rung.
  const kiv::RecursiveMerge3Strategy recursive(std::make_unique<kiv::AcceptTheirsMergeTool>());
  qf::zero::Transaction scratch = model->beginTransaction();
  const kiv::Commit merged = recursive.run(xs[kRungs], ys[kRungs]);
  EXPECT_TRUE(merged && merged.isLive());
  scratch.cancel();

  // An ancestor of the tip is the deepest common ancestor, once per walk from the tip to
  // it: exponentially many entries of one commit, which the three-way strategy refuses and
  // the recursive one takes as its base.
  const kiv::merge::AncestorList ofAnAncestor = kiv::merge::summarizeLowestCommonAncestors(xs[kRungs], xs[3]);
  EXPECT_EQ(ofAnAncestor.length, 3u);
  EXPECT_EQ(ofAnAncestor.first, xs[3]);
  EXPECT_EQ(ofAnAncestor.second, xs[3]);
  EXPECT_FALSE(ofAnAncestor.isUnique());
}

}  // namespace
