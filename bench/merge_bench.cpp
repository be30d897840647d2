// Merging two branches of a long history, in one run:
//
//   A user model of N cards (about 250 bytes of JSON each; N = 10,000 and 100,000) whose
//   initial commit creates them all; a main line of 100 commits of 10 changed cards each;
//   a side line forked at main commit 50 with 50 commits of its own, so that each side
//   changed about 500 cards since the fork. The side changes another property of the
//   cards it shares with main (about one in nine), so the property tool merges them
//   property by property while the accept-theirs tool takes the side's card whole.
//
//   - merge: the recursive three-way strategy merging the side into main, with each tool
//     (0: accept theirs, 1: property by property);
//   - diff3: the three-way comparison alone (the three snapshots it reads and the merged
//     state it writes, both growing with the model and the history rather than with what
//     the sides changed); a merge spends the rest in its tool.
// Each merge runs in a transaction that is cancelled outside the timed region, so every
// iteration merges the same history.
#include "card_metamodel.h"
#include "kiv/merge/accept_theirs_merge_tool.h"
#include "kiv/merge/merge3_strategy.h"
#include "kiv/merge/property_merge_tool.h"
#include "kiv/merge/recursive_merge3_strategy.h"
#include "kiv/metamodel/commit_impl.h"
#include "kiv/metamodel/delta_impl.h"
#include "qf/zero/core/meta/meta_registry.h"
#include "qf/zero/core/model_impl.h"
#include "qf/zero/io/json_parser.h"
#include "qf/zero/io/json_serializer.h"

#include <benchmark/benchmark.h>

#include <nlohmann/json.hpp>

#include <map>
#include <memory>
#include <string>
#include <vector>

namespace {

using qf::zero::Model;
using qf::zero::ModelElement;
using qf::zero::Transaction;
using qf::zero::Value;

const bench::CardMetamodel& mergeCards() {
  static const bench::CardMetamodel instance(u"/bench/merge", u"bm");
  return instance;
}

// One line of work: a user model of its own and the tip it records onto.
struct Line {
  Model user = Model::create();
  std::vector<ModelElement> cards;
  kiv::Commit tip;

  // Sets `property` of the cards first, first + stride, ... (count of them) and records
  // them as one commit on the tip.
  void record(const Model& repository, const qf::zero::meta::Property& property, std::size_t first,
              std::size_t stride, std::size_t count, int value) {
    std::vector<ModelElement> changed;
    {
      Transaction edit = user->beginTransaction();
      for (std::size_t i = 0; i < count; ++i) {
        ModelElement& card = cards[(first + i * stride) % cards.size()];
        card.setPropertyValue(property, Value::of(value));
        changed.push_back(card);
      }
      edit.commit();
    }
    Transaction transaction = repository->beginTransaction();
    const kiv::Commit commit = kiv::Commit::create(repository);
    commit->addParent(tip);
    for (const ModelElement& card : changed) commit->addUpdated(card);
    transaction.commit();
    tip = commit;
  }

  // A line that starts where this one stands, in a copy of its user model.
  Line fork() const {
    nlohmann::ordered_json document;
    qf::zero::io::JSONSerializer().serialize(
        user, qf::zero::io::SerializationOutput::forIntermediateFormat(&document));
    Line copy;
    qf::zero::io::JSONParser().parseVerbatim(document, copy.user);
    for (const ModelElement& card : cards) copy.cards.push_back(copy.user->findElement(card.getUuid()));
    copy.tip = tip;
    return copy;
  }
};

class DivergedHistory {
 public:
  explicit DivergedHistory(std::size_t n) {
    const bench::CardMetamodel& m = mergeCards();
    {
      Transaction build = main_.user->beginTransaction();
      for (std::size_t i = 0; i < n; ++i) main_.cards.push_back(m.makeCard(main_.user, i));
      build.commit();
    }
    {
      Transaction transaction = repository_->beginTransaction();
      main_.tip = kiv::Commit::create(repository_);
      for (const ModelElement& card : main_.cards) main_.tip->addCreated(card);
      transaction.commit();
    }
    // Main changes the weight of cards 10, 11, 12, ... up to 999; the side changes the
    // count of every ninth card from card 500 on, so the 56 of its cards below 1,000 are
    // also main's.
    Line side;
    for (std::size_t commit = 1; commit < 100; ++commit) {
      if (commit == 50) side = main_.fork();
      main_.record(repository_, m.weight, commit * 10, 1, 10, static_cast<int>(commit));
    }
    for (std::size_t commit = 0; commit < 50; ++commit) {
      side.record(repository_, m.count, 500 + commit * 10 * 9, 9, 10, -static_cast<int>(commit));
    }
    theirs_ = side.tip;
  }

  const Model& repository() const { return repository_; }
  const kiv::Commit& ours() const { return main_.tip; }
  const kiv::Commit& theirs() const { return theirs_; }

 private:
  Model repository_ = Model::create();
  Line main_;
  kiv::Commit theirs_;
};

DivergedHistory& divergedHistory(std::size_t n) {
  static std::map<std::size_t, std::unique_ptr<DivergedHistory>> histories;
  std::unique_ptr<DivergedHistory>& history = histories[n];
  if (!history) history = std::make_unique<DivergedHistory>(n);
  return *history;
}

// Arguments: N, tool (0: accept theirs, 1: property by property).
void merge(benchmark::State& state) {
  const DivergedHistory& history = divergedHistory(static_cast<std::size_t>(state.range(0)));
  std::unique_ptr<kiv::IMergeTool> tool;
  if (state.range(1) == 0) {
    tool = std::make_unique<kiv::AcceptTheirsMergeTool>();
  } else {
    tool = std::make_unique<kiv::PropertyMergeTool>();
  }
  const kiv::RecursiveMerge3Strategy strategy(std::move(tool));
  std::size_t mergedEntries = 0;
  for (auto _ : state) {
    Transaction cancelled = history.repository()->beginTransaction();
    const kiv::Commit merged = strategy.run(history.ours(), history.theirs());
    state.PauseTiming();
    mergedEntries = merged->getDelta().getCurrent().size();
    cancelled.cancel();
    state.ResumeTiming();
  }
  state.counters["merged_entries"] = static_cast<double>(mergedEntries);
}

// Argument: N. The comparison alone, against the fork point: its three snapshots and the
// merged state it writes; what a merge spends beyond it is its tool's.
void diff3(benchmark::State& state) {
  const DivergedHistory& history = divergedHistory(static_cast<std::size_t>(state.range(0)));
  kiv::Commit base = history.theirs();
  for (int i = 0; i < 50; ++i) base = base->getParent();
  for (auto _ : state) {
    Transaction cancelled = history.repository()->beginTransaction();
    benchmark::DoNotOptimize(kiv::Merge3Strategy::diff3(base, history.ours(), history.theirs()));
    state.PauseTiming();
    cancelled.cancel();
    state.ResumeTiming();
  }
}

// Every 10,000-card run comes before the first 100,000-card history is built: a heap
// that has held the larger one makes the smaller runs slower by half.
BENCHMARK(merge)->Args({10000, 0})->Args({10000, 1})->Unit(benchmark::kMillisecond)->MinTime(2.0);
BENCHMARK(diff3)->Arg(10000)->Unit(benchmark::kMillisecond)->MinTime(2.0);
BENCHMARK(merge)->Args({100000, 0})->Args({100000, 1})->Unit(benchmark::kMillisecond)->MinTime(2.0);
BENCHMARK(diff3)->Arg(100000)->Unit(benchmark::kMillisecond)->MinTime(2.0);

}  // namespace
