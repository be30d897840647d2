// The walks of a recorded history against its length and shape.
//
// Linear histories of 100, 1,000 and 10,000 commits over one small user model:
//   - getSnapshot of the tip, asked again and again: the state kept for the tip (the first
//     call composes every delta back to the initial commit);
//   - diff of the tip against a commit 10 back (a short path) and against the initial
//     commit (the whole history);
//   - find of an element from the tip, for one last recorded in the initial commit (the
//     walk spans the history) and one recorded by the tip itself (the walk stops at once).
// The walks are linear in the number of commits they pass, so a diff to the initial commit
// should grow tenfold from size to size while a diff 10 back and a snapshot stay flat.
// The counter per_commit divides the time by the commits passed. Each commit here takes
// about 4.5 KB of the repository model, so 10,000 of them outgrow the caches and every
// commit passed then costs several times more: compare per_commit across sizes.
//
// Longer lines of 1,000, 10,000 and 100,000 commits: the snapshot of a new tip, and a merge
// of two branches that left the line 10 commits ago, each costing the commits since a kept
// state: flat in the length.
//
// A line with merges: findAllPaths keeps no visited set, so every merge of a side line
// doubles the number of paths from the tip, and the time with it.
#include "kiv/merge/default_merge_strategy.h"
#include "kiv/merge/merge_strategy.h"
#include "kiv/metamodel/commit_impl.h"
#include "kiv/metamodel/delta_impl.h"
#include "kiv/metamodel/object_storage_impl.h"
#include "qf/zero/core/meta/meta_registry.h"
#include "qf/zero/core/model_impl.h"
#include "qf/zero/core/transaction.h"

#include <benchmark/benchmark.h>

#include <chrono>
#include <cstdio>
#include <map>
#include <memory>
#include <string>
#include <vector>

namespace {

using qf::zero::Model;
using qf::zero::ModelElement;
using qf::zero::Transaction;
using qf::zero::Value;
namespace meta = qf::zero::meta;

// The user metamodel: package "/bench/history" with class Item {name: String, count: Integer}.
struct ItemMetamodel {
  Model metaModel = Model::create();
  meta::Package package = meta::Package::create(metaModel, {}, u"/bench/history", u"bh");
  meta::Class item = meta::Class::create(metaModel, {}, u"Item", u"bh.Item", false);
  meta::Property name = meta::Property::create(metaModel, {}, u"name", meta::ValueFlags::Single, false);
  meta::Property count = meta::Property::create(metaModel, {}, u"count", meta::ValueFlags::Single, false);

  ItemMetamodel() {
    auto& registry = meta::MetaRegistry::getInstance();
    item->setSuperclass(ModelElement::metaClass());
    name->setType(registry.getPrimitiveType(u"String"));
    name->setPropertyIndex(1);
    item->addProperty(name);
    count->setType(registry.getPrimitiveType(u"Integer"));
    count->setPropertyIndex(2);
    item->addProperty(count);
    package->addType(item);
    registry.registerRootPackage(package);
  }
  ~ItemMetamodel() { meta::MetaRegistry::getInstance().unregisterRootPackage(u"/bench/history"); }
  ItemMetamodel(const ItemMetamodel&) = delete;
  ItemMetamodel& operator=(const ItemMetamodel&) = delete;
};

const ItemMetamodel& itemMetamodel() {
  static const ItemMetamodel instance;
  return instance;
}

// The user model and its edits:
//   - 50 items; commits 0 to 4 each create 10 of them (commit 0 is the initial commit);
//   - every later commit changes the count of 3 items and records them as updated, taking
//     items 1..49 in turn, so each of them is recorded again every 17 commits or so;
//   - item 0 is never changed after its creation: its last state is in the initial commit.
// The state at every commit thus holds 50 items however long the history grows.
constexpr std::size_t kItemCount = 50;
constexpr std::size_t kCreatedPerCommit = 10;
constexpr std::size_t kCreatingCommits = kItemCount / kCreatedPerCommit;
constexpr std::size_t kUpdatedPerCommit = 3;
constexpr std::size_t kDormantItem = 0;

std::u16string itemName(std::size_t number) {
  const std::string digits = std::to_string(number);
  return u"item " + std::u16string(digits.begin(), digits.end());
}

class LinearHistory {
 public:
  explicit LinearHistory(std::size_t length) {
    const auto started = std::chrono::steady_clock::now();
    for (std::size_t index = 0; index < length; ++index) {
      commits_.push_back(record(commits_.empty() ? kiv::Commit() : commits_.back()));
    }
    const std::chrono::duration<double> took = std::chrono::steady_clock::now() - started;
    std::fprintf(stderr, "recorded a linear history of %zu commits in %.2f s\n", length, took.count());
  }

  // One more commit on `parent` (none: a new initial commit), changing the next items.
  kiv::Commit record(const kiv::Commit& parent) {
    const ItemMetamodel& metamodel = itemMetamodel();
    std::vector<ModelElement> created;
    std::vector<ModelElement> updated;
    {
      Transaction edit = user_->beginTransaction();
      if (items_.size() < kItemCount) {
        for (std::size_t i = 0; i < kCreatedPerCommit; ++i) {
          ModelElement item = metamodel.item.instantiate(user_);
          item.setPropertyValue(metamodel.name, Value::of(itemName(items_.size())));
          items_.push_back(item);
          created.push_back(item);
        }
      } else {
        for (std::size_t i = 0; i < kUpdatedPerCommit; ++i) {
          ModelElement& item = items_[1 + nextUpdated_++ % (kItemCount - 1)];
          item.setPropertyValue(metamodel.count, Value::of(static_cast<int>(nextUpdated_)));
          updated.push_back(item);
        }
      }
      edit.commit();
    }
    Transaction record = repository_->beginTransaction();
    kiv::Commit commit = kiv::Commit::create(repository_);
    if (parent) commit->addParent(parent);
    for (const ModelElement& item : created) commit->addCreated(item);
    for (const ModelElement& item : updated) commit->addUpdated(item);
    record.commit();
    lastUpdated_ = updated;
    return commit;
  }

  const Model& repository() const { return repository_; }
  const kiv::Commit& tip() const { return commits_.back(); }
  const kiv::Commit& initial() const { return commits_.front(); }
  const kiv::Commit& back(std::size_t steps) const { return commits_[commits_.size() - 1 - steps]; }
  qf::zero::Uuid dormantItem() const { return items_[kDormantItem].getUuid(); }
  qf::zero::Uuid itemRecordedByTip() const { return lastUpdated_.front().getUuid(); }

 private:
  Model repository_ = Model::create();
  Model user_ = Model::create();
  std::vector<ModelElement> items_;
  std::vector<kiv::Commit> commits_;
  std::vector<ModelElement> lastUpdated_;
  std::size_t nextUpdated_ = 0;
};

// Each history is recorded once, on first use, and kept for the rest of the run.
LinearHistory& linearHistory(std::size_t length) {
  static std::map<std::size_t, std::unique_ptr<LinearHistory>> histories;
  std::unique_ptr<LinearHistory>& history = histories[length];
  if (!history) history = std::make_unique<LinearHistory>(length);
  return *history;
}

void setCommitCounters(benchmark::State& state, std::size_t commitsWalked) {
  state.counters["commits"] = static_cast<double>(commitsWalked);
  state.counters["per_commit"] =
      benchmark::Counter(static_cast<double>(commitsWalked),
                         benchmark::Counter::kIsIterationInvariantRate | benchmark::Counter::kInvert);
}

// getSnapshot and diff make their result as a new delta in the repository model. Each
// call runs in a repository transaction that is cancelled afterwards, so the model does
// not grow over the iterations; the cancellation runs with the timer paused.
template <class Call>
void measureCancelled(benchmark::State& state, const Model& repository, Call&& call) {
  std::size_t entries = 0;
  for (auto _ : state) {
    Transaction scratch = repository->beginTransaction();
    kiv::Delta result = call();
    entries = result->getCurrent().size() + result->getPrevious().size();
    state.PauseTiming();
    scratch.cancel();
    result = {};
    state.ResumeTiming();
  }
  state.counters["entries"] = static_cast<double>(entries);
}

void snapshotOfTip(benchmark::State& state) {
  const LinearHistory& history = linearHistory(static_cast<std::size_t>(state.range(0)));
  measureCancelled(state, history.repository(), [&] { return history.tip()->getSnapshot(); });
  setCommitCounters(state, static_cast<std::size_t>(state.range(0)));
}

constexpr std::size_t kNearDistance = 10;

void diffOfTipAgainstNear(benchmark::State& state) {
  const LinearHistory& history = linearHistory(static_cast<std::size_t>(state.range(0)));
  const kiv::Commit& near = history.back(kNearDistance);
  measureCancelled(state, history.repository(), [&] { return history.tip()->diff(near); });
  setCommitCounters(state, kNearDistance);
}

void diffOfTipAgainstInitial(benchmark::State& state) {
  const LinearHistory& history = linearHistory(static_cast<std::size_t>(state.range(0)));
  measureCancelled(state, history.repository(), [&] { return history.tip()->diff(history.initial()); });
  setCommitCounters(state, static_cast<std::size_t>(state.range(0)));
}

// find only reads the history: no transaction is needed.
void findFromTip(benchmark::State& state, bool dormant) {
  const LinearHistory& history = linearHistory(static_cast<std::size_t>(state.range(0)));
  const qf::zero::Uuid item = dormant ? history.dormantItem() : history.itemRecordedByTip();
  for (auto _ : state) {
    kiv::ObjectStorage storage = history.tip()->find(item);
    benchmark::DoNotOptimize(storage.getImpl());
  }
  if (!history.tip()->find(item)) state.SkipWithError("the item was not found");
  setCommitCounters(state, dormant ? static_cast<std::size_t>(state.range(0)) : 1);
}

void historyLengths(benchmark::internal::Benchmark* benchmark) {
  benchmark->Arg(100)->Arg(1000)->Arg(10000)->ArgName("length");
}

// In steady use: each iteration first records one more commit on the line (untimed), then
// takes the snapshot of that new tip, which starts from the state kept for its parent.
void snapshotOfNewTip(benchmark::State& state) {
  LinearHistory& history = linearHistory(static_cast<std::size_t>(state.range(0)));
  kiv::Commit tip = history.tip();
  const Model& repository = history.repository();
  {
    // The first snapshot composes the whole line; what is measured is the steady state.
    Transaction warmUp = repository->beginTransaction();
    tip->getSnapshot();
    warmUp.cancel();
  }
  for (auto _ : state) {
    state.PauseTiming();
    tip = history.record(tip);
    Transaction scratch = repository->beginTransaction();
    state.ResumeTiming();
    benchmark::DoNotOptimize(tip->getSnapshot());
    state.PauseTiming();
    scratch.cancel();
    state.ResumeTiming();
  }
}

// Two branches of 10 commits each that leave the line's tip, made afresh for each iteration
// (untimed), merged by the default strategy (rolled back): three snapshots, the base's kept
// and each tip's 10 commits from it. Few iterations: recording a branch moves the index of
// first-parent states from line to line, which costs the line's length each time.
void mergeOfBranchesTenBack(benchmark::State& state) {
  LinearHistory& history = linearHistory(static_cast<std::size_t>(state.range(0)));
  const kiv::Commit base = history.tip();
  const auto branch = [&] {
    kiv::Commit tip = base;
    for (int i = 0; i < 10; ++i) tip = history.record(tip);
    return tip;
  };
  const std::shared_ptr<kiv::IMergeStrategy> strategy = kiv::makeDefaultMergeStrategy();
  const Model& repository = history.repository();
  {
    Transaction warmUp = repository->beginTransaction();
    strategy->run(branch(), branch());
    warmUp.cancel();
  }
  for (auto _ : state) {
    state.PauseTiming();
    const kiv::Commit ours = branch();
    const kiv::Commit theirs = branch();
    Transaction scratch = repository->beginTransaction();
    state.ResumeTiming();
    benchmark::DoNotOptimize(strategy->run(ours, theirs));
    state.PauseTiming();
    scratch.cancel();
    state.ResumeTiming();
  }
}

// The same merge again and again, each cancelled: everything it asks of the history (the
// three snapshots, the depths of the commits) is kept, so this is the merge itself.
void mergeAgainOfBranchesTenBack(benchmark::State& state) {
  LinearHistory& history = linearHistory(static_cast<std::size_t>(state.range(0)));
  const kiv::Commit base = history.tip();
  kiv::Commit ours = base, theirs = base;
  for (int i = 0; i < 10; ++i) {
    ours = history.record(ours);
    theirs = history.record(theirs);
  }
  const std::shared_ptr<kiv::IMergeStrategy> strategy = kiv::makeDefaultMergeStrategy();
  for (auto _ : state) {
    Transaction scratch = history.repository()->beginTransaction();
    benchmark::DoNotOptimize(strategy->run(ours, theirs));
    state.PauseTiming();
    scratch.cancel();
    state.ResumeTiming();
  }
}

// The change from one branch's tip to the other's, the two having left the line 10 commits
// ago: neither is an ancestor of the other, so it is the one snapshot composed with the
// inverse of the other, both kept; finding that there is no path costs the commits taller
// than the target, not the line.
void diffOfBranchesTenBack(benchmark::State& state) {
  LinearHistory& history = linearHistory(static_cast<std::size_t>(state.range(0)));
  kiv::Commit ours = history.tip(), theirs = history.tip();
  for (int i = 0; i < 10; ++i) {
    ours = history.record(ours);
    theirs = history.record(theirs);
  }
  {
    // The first snapshots compose the whole line; what is measured is the steady state.
    Transaction warmUp = history.repository()->beginTransaction();
    ours->diff(theirs);
    warmUp.cancel();
  }
  measureCancelled(state, history.repository(), [&] { return ours->diff(theirs); });
}

void longHistoryLengths(benchmark::internal::Benchmark* benchmark) {
  benchmark->Arg(1000)->Arg(10000)->Arg(100000)->ArgName("length")->Unit(benchmark::kMicrosecond);
}

BENCHMARK(snapshotOfNewTip)->Apply(longHistoryLengths);
BENCHMARK(diffOfBranchesTenBack)->Apply(longHistoryLengths);
BENCHMARK(mergeOfBranchesTenBack)->Apply(longHistoryLengths)->Iterations(40);
BENCHMARK(mergeAgainOfBranchesTenBack)->Apply(longHistoryLengths);

BENCHMARK(snapshotOfTip)->Apply(historyLengths)->Unit(benchmark::kMicrosecond);
BENCHMARK(diffOfTipAgainstNear)->Apply(historyLengths)->Unit(benchmark::kMicrosecond);
BENCHMARK(diffOfTipAgainstInitial)->Apply(historyLengths)->Unit(benchmark::kMicrosecond);
BENCHMARK_CAPTURE(findFromTip, last_recorded_in_initial, true)
    ->Apply(historyLengths)
    ->Unit(benchmark::kMicrosecond);
BENCHMARK_CAPTURE(findFromTip, recorded_by_tip, false)->Apply(historyLengths)->Unit(benchmark::kNanosecond);

// A line of `merges` merges from an initial commit: before each merge the line gains
// kPlainBetweenMerges - 1 plain commits, then a side line of one commit branches off the
// latest main commit and the merge joins the two (first parent: the main line). Every
// path from the tip chooses, at each merge, between the main line and the side commit,
// so there are 2^merges of them. Commits record nothing: findAllPaths reads parents only.
constexpr std::size_t kPlainBetweenMerges = 3;

struct MergeLine {
  Model repository = Model::create();
  kiv::Commit tip;
  // A child of the initial commit on a line of its own: not an ancestor of the tip.
  kiv::Commit outsider;
  std::size_t commitCount = 0;

  explicit MergeLine(std::size_t merges) {
    Transaction record = repository->beginTransaction();
    tip = newCommit({});
    outsider = kiv::Commit::create(repository);
    outsider->addParent(tip);
    for (std::size_t merge = 0; merge < merges; ++merge) {
      for (std::size_t i = 1; i < kPlainBetweenMerges; ++i) tip = newCommit({tip});
      const kiv::Commit side = newCommit({tip});
      tip = newCommit({tip, side});
    }
    record.commit();
  }

  kiv::Commit newCommit(const std::vector<kiv::Commit>& parents) {
    kiv::Commit commit = kiv::Commit::create(repository);
    for (const kiv::Commit& parent : parents) commit->addParent(parent);
    ++commitCount;
    return commit;
  }
};

void findAllPathsOfMergeLine(benchmark::State& state) {
  const MergeLine line(static_cast<std::size_t>(state.range(0)));
  std::size_t paths = 0;
  std::size_t pathCommits = 0;
  for (auto _ : state) {
    const std::vector<std::vector<kiv::Commit>> found = line.tip->findAllPaths();
    paths = found.size();
    // One pass over the paths: small beside making them.
    pathCommits = 0;
    for (const auto& path : found) pathCommits += path.size();
  }
  state.counters["paths"] = static_cast<double>(paths);
  state.counters["path_commits"] = static_cast<double>(pathCommits);
  state.counters["line_commits"] = static_cast<double>(line.commitCount);
}

// One call passes a second at about 20 merges.
BENCHMARK(findAllPathsOfMergeLine)->DenseRange(1, 20)->ArgName("merges")->Unit(benchmark::kMillisecond);

// A "no" from isPredecessorOf (and from findPath, and so diff against a commit that is not
// an ancestor) is answered by a walk with a visited set, not by the path walk: it stays
// linear in the line's commits where the path walk would meet every one of the paths
// counted here (a second and a half at 20 merges).
void outsiderIsNotPredecessorOfMergeLineTip(benchmark::State& state) {
  const MergeLine line(static_cast<std::size_t>(state.range(0)));
  bool predecessor = false;
  for (auto _ : state) {
    predecessor = line.outsider->isPredecessorOf(line.tip);
    benchmark::DoNotOptimize(predecessor);
  }
  if (predecessor) state.SkipWithError("the outsider was found among the tip's ancestors");
  state.counters["paths"] = static_cast<double>(std::size_t{1} << state.range(0));
}

BENCHMARK(outsiderIsNotPredecessorOfMergeLineTip)
    ->DenseRange(4, 20, 4)
    ->ArgName("merges")
    ->Unit(benchmark::kMicrosecond);

}  // namespace
