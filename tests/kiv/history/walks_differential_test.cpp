// The library's graph walks against the literal path enumerations, on seeded random commit
// graphs: ladders and criss-crosses of two lines merging each other, fan-ins of several
// lines merged two at a time, forks from old commits and unrelated roots. Each graph is
// small enough for the enumerations; the test takes as many as fit in its time budget
// (KIV_DIFFERENTIAL_SECONDS, 60 s unless set) and names the seed of any graph that differs.
#include "kiv/merge/lowest_common_ancestors.h"
#include "kiv/merge/merge3_strategy.h"
#include "kiv/metamodel/commit_impl.h"
#include "literal_walks.h"
#include "qf/zero/core/model_impl.h"

#include <gtest/gtest.h>

#include <chrono>
#include <cstdint>
#include <cstdlib>
#include <random>
#include <sstream>
#include <string>
#include <unordered_map>
#include <unordered_set>
#include <vector>

namespace {

using kiv::Commit;
using Clock = std::chrono::steady_clock;

// The enumerations take every path; graphs with more are drawn again.
constexpr std::size_t kMostPathsPerCommit = 200;

class RandomHistory {
 public:
  explicit RandomHistory(std::uint64_t seed) : random_(seed) {
    const std::size_t size = std::uniform_int_distribution<std::size_t>(2, 16)(random_);
    std::vector<std::size_t> tips{add({})};
    while (commits_.size() < size) {
      const int action = std::uniform_int_distribution<int>(0, 99)(random_);
      if (action < 5) {
        tips.push_back(add({}));  // an unrelated root
      } else if (action < 20) {
        tips.push_back(add({pick(commits_.size())}));  // a fork from anywhere
      } else if (action < 55 || tips.size() < 2) {
        std::size_t& tip = tips[pick(tips.size())];
        tip = add({tip});
      } else {
        // A merge of two lines; the merged-in line goes on, so the two can cross again.
        const std::size_t into = pick(tips.size());
        std::size_t from = pick(tips.size() - 1);
        if (from >= into) ++from;
        tips[into] = add({tips[into], tips[from]});
      }
    }
  }

  const std::vector<Commit>& commits() const { return commits_; }
  std::size_t pick(std::size_t count) {
    return std::uniform_int_distribution<std::size_t>(0, count - 1)(random_);
  }

  bool smallEnoughForTheOracle() const {
    std::vector<std::size_t> paths(commits_.size(), 0);
    for (std::size_t i = 0; i < commits_.size(); ++i) {
      paths[i] = parents_[i].empty() ? 1 : 0;
      for (std::size_t parent : parents_[i]) paths[i] += paths[parent];
      if (paths[i] > kMostPathsPerCommit) return false;
    }
    return true;
  }

  std::string spell(const std::vector<Commit>& path) const {
    std::string text;
    for (const Commit& commit : path) text += name(commit) + " ";
    return text;
  }
  std::string spell(const std::unordered_set<Commit>& commits) const {
    std::vector<std::string> names;
    for (const Commit& commit : commits) names.push_back(name(commit));
    std::sort(names.begin(), names.end());
    std::string text;
    for (const std::string& n : names) text += n + " ";
    return text;
  }
  std::string describe() const {
    std::ostringstream text;
    for (std::size_t i = 0; i < commits_.size(); ++i) {
      text << i << ":";
      for (std::size_t parent : parents_[i]) text << " " << parent;
      text << "; ";
    }
    return text.str();
  }
  std::unordered_set<Commit> someCommits(std::size_t most) {
    std::unordered_set<Commit> chosen;
    const std::size_t count = pick(most + 1);
    for (std::size_t i = 0; i < count; ++i) chosen.insert(commits_[pick(commits_.size())]);
    return chosen;
  }

 private:
  std::size_t add(const std::vector<std::size_t>& parents) {
    Commit commit = Commit::create(model_);
    for (std::size_t parent : parents) commit->addParent(commits_[parent]);
    index_[commit.getImpl()] = commits_.size();
    commits_.push_back(commit);
    parents_.push_back(parents);
    return commits_.size() - 1;
  }
  std::string name(const Commit& commit) const {
    return commit ? std::to_string(index_.at(commit.getImpl())) : std::string("null");
  }

  std::mt19937_64 random_;
  qf::zero::Model model_ = qf::zero::Model::create();
  std::vector<Commit> commits_;
  std::vector<std::vector<std::size_t>> parents_;
  std::unordered_map<const void*, std::size_t> index_;
};

std::chrono::seconds budget() {
  const char* set = std::getenv("KIV_DIFFERENTIAL_SECONDS");
  return std::chrono::seconds(set != nullptr ? std::atoi(set) : 60);
}

// Every walk of one graph against the oracle; false after the first difference.
bool agreesWithTheOracle(RandomHistory& graph) {
  const std::vector<Commit>& commits = graph.commits();
  for (const Commit& from : commits) {
    for (const Commit& to : commits) {
      const auto expected = kiv::literal::findPath(from, to);
      const auto actual = from->findPath(to);
      EXPECT_EQ(graph.spell(actual), graph.spell(expected))
          << "findPath from " << graph.spell(std::vector<Commit>{from}) << "to "
          << graph.spell(std::vector<Commit>{to});
      if (actual != expected) return false;
    }
  }
  for (int round = 0; round < 12; ++round) {
    const Commit a = commits[graph.pick(commits.size())];
    const Commit b = commits[graph.pick(commits.size())];
    const std::vector<Commit> expected = kiv::literal::findLCA(a, b);
    const std::vector<Commit> actual = kiv::Merge3Strategy::findLCA(a, b);
    EXPECT_EQ(graph.spell(actual), graph.spell(expected))
        << "findLCA of " << graph.spell(std::vector<Commit>{a, b});
    const kiv::merge::AncestorList summary = kiv::merge::summarizeLowestCommonAncestors(a, b);
    EXPECT_EQ(summary.isUnique(), expected.size() == 1)
        << "one ancestor to merge from, " << graph.spell(std::vector<Commit>{a, b});
    if (expected.size() >= 1) {
      EXPECT_EQ(summary.first, expected[0]);
    }
    if (expected.size() >= 2) {
      EXPECT_EQ(summary.second, expected[1]);
      EXPECT_EQ(summary.length, std::min<std::size_t>(expected.size(), 3));
    }
    if (expected.empty()) {
      EXPECT_EQ(summary.length, 0u);
    }
    if (::testing::Test::HasFailure()) return false;
  }
  for (int round = 0; round < 12; ++round) {
    const std::unordered_set<Commit> starts = graph.someCommits(3);
    const std::unordered_set<Commit> before = graph.someCommits(2);
    // Negative depths, 0, the first few places, and anything up to past the longest path.
    const std::size_t kind = graph.pick(6);
    const int depth =
        kind == 5 ? static_cast<int>(graph.pick(commits.size() + 2)) : static_cast<int>(kind) - 2;
    std::unordered_set<Commit> expected = before, actual = before;
    kiv::literal::select(starts, expected, depth);
    Commit::Impl::select(starts, actual, depth);
    EXPECT_EQ(graph.spell(actual), graph.spell(expected))
        << "select depth " << depth << " of " << graph.spell(starts);

    const std::unordered_set<Commit> older = graph.someCommits(3);
    expected = before;
    actual = before;
    kiv::literal::selectInRange(older, starts, expected);
    Commit::Impl::selectInRange(older, starts, actual);
    EXPECT_EQ(graph.spell(actual), graph.spell(expected))
        << "selectInRange from " << graph.spell(older) << "to " << graph.spell(starts);
    if (::testing::Test::HasFailure()) return false;
  }
  return true;
}

TEST(WalksAgainstTheOracle, RandomCommitGraphsGiveTheSameResults) {
  const Clock::time_point end = Clock::now() + budget();
  std::size_t compared = 0;
  for (std::uint64_t seed = 1; Clock::now() < end; ++seed) {
    RandomHistory graph(seed);
    if (!graph.smallEnoughForTheOracle()) continue;
    ASSERT_TRUE(agreesWithTheOracle(graph)) << "seed " << seed << ", graph " << graph.describe();
    ++compared;
  }
  RecordProperty("graphs", static_cast<int>(compared));
  EXPECT_GT(compared, 0u);
}

}  // namespace
