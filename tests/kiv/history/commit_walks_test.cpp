// Walks over shaped commit graphs: paths, ancestry, selection by depth and by range.
#include "kiv/metamodel/commit_impl.h"
#include "qf/zero/core/model_impl.h"

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

}  // namespace
