// The commit path against the JSON library underneath it, in one run:
//
//   - recordCommit: recording a commit of k updated elements (k = 1, 10, 100) on the tip
//     of a history, in a user model of N elements and over a history of L commits, against
//     nlohmannEntries: building and dumping those k entries with nlohmann alone. Recording
//     should cost a small multiple of that bound, whatever N and L are.
//   - applyDelta: applying the change between two commits about 1,000 elements apart to a
//     user model through its change report (what undo, redo and checkout do), and the same
//     with the report made from the delta, against nlohmannParse: parsing the report's text.
//   - storedVersionMemory: heap bytes held per stored element version, over a history
//     of 1,000 commits of 10 updates each.
//
// User elements are cards of about 260 bytes of JSON each.
#include "card_metamodel.h"
#include "kiv/history/element_reuse_model_builder.h"
#include "kiv/metamodel/commit_impl.h"
#include "kiv/metamodel/delta_impl.h"
#include "kiv/metamodel/object_storage_impl.h"
#include "qf/zero/core/meta/meta_registry.h"
#include "qf/zero/core/model_impl.h"
#include "qf/zero/io/json_change_report_synchronizer.h"
#include "qf/zero/io/json_serializer.h"

#include <benchmark/benchmark.h>

#include <nlohmann/json.hpp>

#include <malloc.h>

#include <map>
#include <memory>
#include <string>
#include <tuple>
#include <vector>

namespace {

using nlohmann::ordered_json;
using qf::zero::Model;
using qf::zero::ModelElement;
using qf::zero::Transaction;
using qf::zero::Value;

const bench::CardMetamodel& cards() {
  static const bench::CardMetamodel instance(u"/bench/commit", u"bc");
  return instance;
}

// A user model of n cards and a repository whose initial commit creates them all.
class CardHistory {
 public:
  explicit CardHistory(std::size_t n) {
    const bench::CardMetamodel& m = cards();
    {
      Transaction build = user_->beginTransaction();
      for (std::size_t i = 0; i < n; ++i) cards_.push_back(m.makeCard(user_, i));
      build.commit();
    }
    Transaction record = repository_->beginTransaction();
    tip_ = kiv::Commit::create(repository_);
    for (const ModelElement& card : cards_) tip_->addCreated(card);
    record.commit();
  }

  // Changes the count of k cards, taken in turn, and records them as one commit on the tip.
  void recordUpdates(std::size_t k) {
    const bench::CardMetamodel& m = cards();
    std::vector<ModelElement> changed;
    {
      Transaction edit = user_->beginTransaction();
      for (std::size_t i = 0; i < k; ++i) {
        ModelElement& card = cards_[next_++ % cards_.size()];
        card.setPropertyValue(m.weight, Value::of(static_cast<int>(next_)));
        changed.push_back(card);
      }
      edit.commit();
    }
    Transaction record = repository_->beginTransaction();
    const kiv::Commit commit = kiv::Commit::create(repository_);
    commit->addParent(tip_);
    for (const ModelElement& card : changed) commit->addUpdated(card);
    record.commit();
    tip_ = commit;
  }

  // Records, without changing the user model, a commit of the next k cards.
  void recordOnly(std::size_t k) {
    Transaction record = repository_->beginTransaction();
    const kiv::Commit commit = kiv::Commit::create(repository_);
    commit->addParent(tip_);
    for (std::size_t i = 0; i < k; ++i) commit->addUpdated(cards_[next_++ % cards_.size()]);
    record.commit();
    tip_ = commit;
  }

  std::vector<ModelElement> nextCards(std::size_t k) const {
    std::vector<ModelElement> result;
    for (std::size_t i = 0; i < k; ++i) result.push_back(cards_[(next_ + i) % cards_.size()]);
    return result;
  }

  const Model& user() const { return user_; }
  const Model& repository() const { return repository_; }
  const kiv::Commit& tip() const { return tip_; }

 private:
  Model repository_ = Model::create();
  Model user_ = Model::create();
  std::vector<ModelElement> cards_;
  kiv::Commit tip_;
  std::size_t next_ = 0;
};

// A history of `length` commits over `n` cards, 10 updates per commit after the initial one;
// made once per (n, length) and kept for the run.
CardHistory& cardHistory(std::size_t n, std::size_t length) {
  static std::map<std::pair<std::size_t, std::size_t>, std::unique_ptr<CardHistory>> histories;
  std::unique_ptr<CardHistory>& history = histories[{n, length}];
  if (!history) {
    history = std::make_unique<CardHistory>(n);
    for (std::size_t i = 1; i < length; ++i) history->recordUpdates(10);
  }
  return *history;
}

std::size_t entryBytes(const ModelElement& card) {
  qf::zero::io::JSONSerializer serializer;
  serializer.getCustomizer().setShouldSkipDefaultValues(false);
  return serializer.writeEntry(card).dump().size();
}

void perElementCounter(benchmark::State& state, std::size_t k) {
  state.counters["per_element"] = benchmark::Counter(
      static_cast<double>(k), benchmark::Counter::kIsIterationInvariantRate | benchmark::Counter::kInvert);
}

// Arguments: k, N, L. The history grows by one commit per iteration.
void recordCommit(benchmark::State& state) {
  const auto k = static_cast<std::size_t>(state.range(0));
  CardHistory& history =
      cardHistory(static_cast<std::size_t>(state.range(1)), static_cast<std::size_t>(state.range(2)));
  for (auto _ : state) history.recordOnly(k);
  state.counters["entry_bytes"] = static_cast<double>(entryBytes(history.nextCards(1).front()));
  perElementCounter(state, k);
}

// Argument: k. The bound: k entries as the serializer writes them, rebuilt and dumped.
void nlohmannEntries(benchmark::State& state) {
  const auto k = static_cast<std::size_t>(state.range(0));
  const CardHistory& history = cardHistory(1000, 100);
  qf::zero::io::JSONSerializer serializer;
  serializer.getCustomizer().setShouldSkipDefaultValues(false);
  std::vector<ordered_json> entries;
  for (const ModelElement& card : history.nextCards(k)) entries.push_back(serializer.writeEntry(card));
  for (auto _ : state) {
    for (const ordered_json& prepared : entries) {
      ordered_json entry = ordered_json::object();
      for (const auto& [key, value] : prepared.items()) entry[key] = value;
      benchmark::DoNotOptimize(entry.dump());
    }
  }
  perElementCounter(state, k);
}

void recordArguments(benchmark::internal::Benchmark* benchmark) {
  for (int k : {1, 10, 100}) {
    benchmark->Args({k, 1000, 100})->Args({k, 10000, 100})->Args({k, 100000, 100})->Args({k, 1000, 10000});
  }
  benchmark->ArgNames({"k", "N", "L"});
}

BENCHMARK(recordCommit)->Apply(recordArguments)->Unit(benchmark::kMicrosecond);
BENCHMARK(nlohmannEntries)->Arg(1)->Arg(10)->Arg(100)->ArgName("k")->Unit(benchmark::kMicrosecond);

// Two commits 1,000 card updates apart over 10,000 cards, and the user model at the first.
// The later commit's delta is the change forwards; its inverse, kept for the run, the
// change backwards.
struct ApartCommits {
  CardHistory history{10000};
  kiv::Commit before;
  kiv::Commit after;
  kiv::Delta forwards;
  kiv::Delta backwards;
  ApartCommits() {
    before = history.tip();
    history.recordUpdates(1000);
    after = history.tip();
    forwards = after->getDelta();
    Transaction invert = history.repository()->beginTransaction();
    backwards = forwards->invert();
    invert.commit();
  }
};

ApartCommits& apartCommits() {
  static ApartCommits instance;
  return instance;
}

void applyReport(const ordered_json& report, const Model& user) {
  qf::zero::io::JSONChangeReportSynchronizer::applyChangeReportVerbatim(
      report, user, std::make_unique<kiv::ElementReuseModelBuilder>());
}

// Each iteration applies the change backwards and then forwards again: 2,000 entries.
void applyDelta(benchmark::State& state, bool withReport) {
  ApartCommits& commits = apartCommits();
  const ordered_json forwards = commits.forwards->toChangeReport();
  const ordered_json backwards = commits.backwards->toChangeReport();
  const Model& user = commits.history.user();
  for (auto _ : state) {
    if (withReport) {
      applyReport(commits.backwards->toChangeReport(), user);
      applyReport(commits.forwards->toChangeReport(), user);
    } else {
      applyReport(backwards, user);
      applyReport(forwards, user);
    }
  }
  perElementCounter(state, 2 * forwards.at("modified").size());
}

void nlohmannParse(benchmark::State& state) {
  ApartCommits& commits = apartCommits();
  const ordered_json forwards = commits.forwards->toChangeReport();
  const std::string texts[2] = {commits.backwards->toChangeReport().dump(), forwards.dump()};
  for (auto _ : state) {
    for (const std::string& text : texts) benchmark::DoNotOptimize(ordered_json::parse(text));
  }
  perElementCounter(state, 2 * forwards.at("modified").size());
}

BENCHMARK_CAPTURE(applyDelta, report_given, false)->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(applyDelta, report_from_delta, true)->Unit(benchmark::kMillisecond);
BENCHMARK(nlohmannParse)->Unit(benchmark::kMillisecond);

// Heap bytes in use (glibc's count), which unlike the resident size sees freed blocks.
std::size_t heapInUse() { return mallinfo2().uordblks; }

void storedVersionMemory(benchmark::State& state) {
  constexpr std::size_t kCommits = 1000;
  constexpr std::size_t kUpdates = 10;
  for (auto _ : state) {
    CardHistory history(1000);
    const std::size_t before = heapInUse();
    for (std::size_t i = 0; i < kCommits; ++i) history.recordOnly(kUpdates);
    const std::size_t after = heapInUse();
    state.counters["bytes_per_version"] =
        static_cast<double>(after - before) / static_cast<double>(kCommits * kUpdates);
    state.counters["entry_bytes"] = static_cast<double>(entryBytes(history.nextCards(1).front()));
  }
}

BENCHMARK(storedVersionMemory)->Iterations(1)->Unit(benchmark::kMillisecond);

}  // namespace
