// The user's road through a workspace, against the JSON work underneath it, in one run:
//
//   - userCommit: a user transaction that changes k cards (k = 1, 10, 100) in a user model
//     of N cards, from the edit to the new commit on the head, against nlohmannEntries:
//     building and dumping those k entries with nlohmann alone. The aim is a small multiple
//     of that bound, flat in N.
//   - undoRedo: one undo and one redo of a 10-card commit, in models of N cards with
//     histories of L commits, against applyEntries: parsing and applying those 10 entries
//     twice (what the two rewrites must at least do).
//   - checkout100: checking out a branch 100 commits behind and back (two moves of 100
//     commits of 10 cards each), against applyMoved: parsing and applying the moved
//     entries forwards and backwards.
//   - pushThenPull: one 10-card commit pushed by one clone and pulled by another, both in
//     one process; pull1000: a pull that brings 1,000 commits.
//
// Cards are elements of about 260 bytes of JSON each.
#include "card_metamodel.h"
#include "kiv/kiv.h"
#include "qf/zero/io/json_parser.h"
#include "qf/zero/io/json_serializer.h"

#include <benchmark/benchmark.h>

#include <nlohmann/json.hpp>

#include <map>
#include <memory>
#include <string>
#include <vector>

namespace {

using nlohmann::ordered_json;
using qf::zero::Model;
using qf::zero::ModelElement;
using qf::zero::Transaction;
using qf::zero::Value;

const bench::CardMetamodel& cards() {
  static const bench::CardMetamodel instance(u"/bench/workspace", u"bw");
  return instance;
}

// A repository with a workspace over n cards, made by one initial commit.
class CardWorkspace {
 public:
  explicit CardWorkspace(std::size_t n) {
    kiv::MetaPackageKiv::getInstance();
    repository_ = kiv::LocalRepository::create(repositories_, user_);
    repository_->init(kiv::RepoType::Regular);
    workspace_ = repository_->getWorkspace(user_);
    workspace_->commitTransaction([&] {
      for (std::size_t i = 0; i < n; ++i) cards_.push_back(cards().makeCard(user_, i));
    });
  }

  // One user transaction changing the weight of the next k cards: one commit.
  void edit(std::size_t k) {
    workspace_->commitTransaction([&] {
      for (std::size_t i = 0; i < k; ++i) {
        ModelElement& card = cards_[next_ % cards_.size()];
        card.setPropertyValue(cards().weight, Value::of(static_cast<int>(++next_)));
      }
    });
  }

  std::vector<ModelElement> nextCards(std::size_t k) const {
    std::vector<ModelElement> result;
    for (std::size_t i = 0; i < k; ++i) result.push_back(cards_[(next_ + i) % cards_.size()]);
    return result;
  }

  const Model& user() const { return user_; }
  const Model& repositories() const { return repositories_; }
  const kiv::Workspace& workspace() const { return workspace_; }
  const kiv::LocalRepository& repository() const { return repository_; }

 private:
  Model repositories_ = Model::create();
  Model user_ = Model::create();
  kiv::LocalRepository repository_;
  kiv::Workspace workspace_;
  std::vector<ModelElement> cards_;
  std::size_t next_ = 0;
};

// A workspace over n cards whose master has `length` commits of 10 cards after the initial
// one, and a branch "back" 100 commits behind master's tip. Made once per (n, length).
CardWorkspace& history(std::size_t n, std::size_t length) {
  static std::map<std::pair<std::size_t, std::size_t>, std::unique_ptr<CardWorkspace>> made;
  std::unique_ptr<CardWorkspace>& entry = made[{n, length}];
  if (!entry) {
    entry = std::make_unique<CardWorkspace>(n);
    for (std::size_t i = 1; i < length; ++i) {
      if (i + 100 == length) {
        entry->workspace()->branch(u"back");
        entry->workspace()->checkout(u"master");
      }
      entry->edit(10);
    }
  }
  return *entry;
}

void perElementCounter(benchmark::State& state, std::size_t k) {
  state.counters["per_element"] = benchmark::Counter(
      static_cast<double>(k), benchmark::Counter::kIsIterationInvariantRate | benchmark::Counter::kInvert);
}

// Arguments: k, N. The history grows by one commit per iteration.
void userCommit(benchmark::State& state) {
  const auto k = static_cast<std::size_t>(state.range(0));
  CardWorkspace& workspace = history(static_cast<std::size_t>(state.range(1)), 1);
  for (auto _ : state) workspace.edit(k);
  perElementCounter(state, k);
}

// Argument: k. The bound: k entries as the serializer writes them, rebuilt and dumped.
void nlohmannEntries(benchmark::State& state) {
  const auto k = static_cast<std::size_t>(state.range(0));
  const CardWorkspace& workspace = history(1000, 1);
  qf::zero::io::JSONSerializer serializer;
  std::vector<ordered_json> entries;
  for (const ModelElement& card : workspace.nextCards(k)) entries.push_back(serializer.writeEntry(card));
  for (auto _ : state) {
    for (const ordered_json& prepared : entries) {
      ordered_json entry = ordered_json::object();
      for (const auto& [key, value] : prepared.items()) entry[key] = value;
      benchmark::DoNotOptimize(entry.dump());
    }
  }
  perElementCounter(state, k);
}

void commitArguments(benchmark::internal::Benchmark* benchmark) {
  for (int k : {1, 10, 100}) {
    for (int n : {1000, 10000, 100000}) benchmark->Args({k, n});
  }
  benchmark->ArgNames({"k", "N"});
}

BENCHMARK(userCommit)->Apply(commitArguments)->Unit(benchmark::kMicrosecond);

// Reading one Integer property of 10,000 cards through the reflective API: what the
// Python module's reads are measured against (bench/python/binding_bench.py).
void readTenThousandValues(benchmark::State& state) {
  const CardWorkspace& workspace = history(10000, 1);
  const std::vector<ModelElement> all = workspace.user()->getTopLevelElements();
  for (auto _ : state) {
    long long sum = 0;
    for (const ModelElement& card : all) sum += card.getPropertyValue(cards().count).getValue<int>();
    benchmark::DoNotOptimize(sum);
  }
}
BENCHMARK(readTenThousandValues)->Unit(benchmark::kMicrosecond);
BENCHMARK(nlohmannEntries)->Arg(1)->Arg(10)->Arg(100)->ArgName("k")->Unit(benchmark::kMicrosecond);

void historyArguments(benchmark::internal::Benchmark* benchmark) {
  for (int n : {10000, 100000}) {
    for (int length : {1000, 10000}) benchmark->Args({n, length});
  }
  benchmark->ArgNames({"N", "L"});
}

// Arguments: N, L.
void undoRedo(benchmark::State& state) {
  CardWorkspace& workspace =
      history(static_cast<std::size_t>(state.range(0)), static_cast<std::size_t>(state.range(1)));
  for (auto _ : state) {
    workspace.workspace()->undo();
    workspace.workspace()->redo();
  }
}

// The baselines rewrite a copy: a transaction on the workspace's own user model, even one
// that changes nothing, would be recorded as a commit.
Model copyOf(const Model& user) {
  ordered_json document;
  qf::zero::io::JSONSerializer().serialize(
      user, qf::zero::io::SerializationOutput::forIntermediateFormat(&document));
  const Model copy = Model::create();
  qf::zero::io::JSONParser().parseVerbatim(document, copy);
  return copy;
}

void parseAndApply(const std::string& text, const Model& user) {
  qf::zero::io::JSONChangeReportSynchronizer::applyChangeReportVerbatim(
      ordered_json::parse(text), user, std::make_unique<kiv::ElementReuseModelBuilder>());
}

// Arguments: N, L. The tip's 10 entries, parsed and applied twice as the user model holds
// them already.
void applyEntries(benchmark::State& state) {
  CardWorkspace& workspace =
      history(static_cast<std::size_t>(state.range(0)), static_cast<std::size_t>(state.range(1)));
  const std::string text = workspace.repository()->getHead()->getTip()->getDelta()->toChangeReport().dump();
  const Model user = copyOf(workspace.user());
  for (auto _ : state) {
    parseAndApply(text, user);
    parseAndApply(text, user);
  }
}

BENCHMARK(undoRedo)->Apply(historyArguments)->Unit(benchmark::kMicrosecond);
BENCHMARK(applyEntries)->Apply(historyArguments)->Unit(benchmark::kMicrosecond);

// Arguments: N, L.
void checkout100(benchmark::State& state) {
  CardWorkspace& workspace =
      history(static_cast<std::size_t>(state.range(0)), static_cast<std::size_t>(state.range(1)));
  for (auto _ : state) {
    workspace.workspace()->checkout(u"back");
    workspace.workspace()->checkout(u"master");
  }
}

// Arguments: N, L. The entries that the two checkouts move, parsed and applied both ways.
void applyMoved(benchmark::State& state) {
  CardWorkspace& workspace =
      history(static_cast<std::size_t>(state.range(0)), static_cast<std::size_t>(state.range(1)));
  const kiv::Commit master = workspace.repository()->getHead()->getTip();
  const kiv::Commit back = workspace.repository()->getBranches().container().at(u"back")->getTip();
  std::string forwards;
  std::string backwards;
  {
    Transaction scratch = workspace.repositories()->beginTransaction();
    kiv::Delta moved = master->diff(back);
    kiv::Delta inverse = moved->invert();
    forwards = moved->toChangeReport().dump();
    backwards = inverse->toChangeReport().dump();
    moved.destroy();
    inverse.destroy();
    scratch.commit();
  }
  const Model user = copyOf(workspace.user());
  for (auto _ : state) {
    parseAndApply(backwards, user);
    parseAndApply(forwards, user);
  }
}

BENCHMARK(checkout100)->Apply(historyArguments)->Unit(benchmark::kMicrosecond);
BENCHMARK(applyMoved)->Apply(historyArguments)->Unit(benchmark::kMicrosecond);

// A bare origin and two clones in one repository model, each clone with its own cards.
struct TwoClones {
  Model repositories = Model::create();
  Model originUser = Model::create();
  kiv::LocalRepository origin;
  kiv::LocalRepository clones[2];
  Model users[2] = {Model::create(), Model::create()};
  kiv::Workspace workspaces[2];
  std::vector<ModelElement> cards;
  std::size_t next = 0;

  TwoClones() {
    kiv::MetaPackageKiv::getInstance();
    origin = kiv::LocalRepository::create(repositories, originUser);
    origin->init(kiv::RepoType::Bare);
    for (int i = 0; i < 2; ++i) {
      clones[i] = kiv::LocalRepository::clone(origin, kiv::RepoType::Regular);
      workspaces[i] = clones[i]->getWorkspace(users[i]);
    }
    workspaces[0]->commitTransaction([&] {
      for (std::size_t i = 0; i < 1000; ++i) cards.push_back(::cards().makeCard(users[0], i));
    });
    clones[0]->synchronousPush(kiv::PushMode::TryPush);
  }
  void edit(std::size_t k) {
    workspaces[0]->commitTransaction([&] {
      for (std::size_t i = 0; i < k; ++i) {
        ModelElement& card = cards[next % cards.size()];
        card.setPropertyValue(::cards().weight, Value::of(static_cast<int>(++next)));
      }
    });
  }
};

void pushThenPull(benchmark::State& state) {
  TwoClones clones;
  for (auto _ : state) {
    state.PauseTiming();
    clones.edit(10);
    state.ResumeTiming();
    clones.clones[0]->push(kiv::PushMode::TryPush).get();
    clones.clones[1]->pull().get();
  }
}

void pull1000(benchmark::State& state) {
  TwoClones clones;
  for (auto _ : state) {
    state.PauseTiming();
    for (int i = 0; i < 1000; ++i) clones.edit(10);
    clones.clones[0]->push(kiv::PushMode::TryPush).get();
    state.ResumeTiming();
    clones.clones[1]->pull().get();
  }
}

BENCHMARK(pushThenPull)->Unit(benchmark::kMicrosecond);
BENCHMARK(pull1000)->Iterations(5)->Unit(benchmark::kMicrosecond);

}  // namespace
