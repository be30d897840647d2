// A merge-heavy history against the number of its merges.
//
// Two clones of one bare origin take turns: each changes 10 of the 1,000 cards of its
// user model and pushes with "MergeFirst", which merges the other's last push first. After
// R rounds (R = 10, 50, 200) the history is a ladder of 2R merges, each of whose sides
// reaches the start along more and more paths: path enumeration would double with every
// rung. On that ladder, per iteration:
//   - merge: the default strategy merging the two clones' tips, each one commit ahead of
//     the last round (the result is rolled back);
//   - push: one more 10-card commit pushed with "MergeFirst" (a merge and a push);
//   - pull: the other clone pulling it (pack and unpack);
//   - checkout: moving to a branch made before the first round and back, across the ladder;
//   - undo: undoing a 10-card commit (and redoing it).
// The aim: each at 200 rounds within 3x its cost at 10 rounds.
#include "card_metamodel.h"
#include "kiv/kiv.h"
#include "kiv/merge/lowest_common_ancestors.h"
#include "kiv/workspace/load_context.h"

#include <benchmark/benchmark.h>

#include <map>
#include <memory>
#include <vector>

namespace {

using qf::zero::Model;
using qf::zero::ModelElement;
using qf::zero::Value;

const bench::CardMetamodel& cards() {
  static const bench::CardMetamodel instance(u"/bench/ladder", u"bl");
  return instance;
}

// A bare origin and two clones in one repository model, each with a user model of the
// same 1,000 cards, and the ladder the two have pushed.
class Ladder {
 public:
  explicit Ladder(std::size_t rounds) {
    kiv::MetaPackageKiv::getInstance();
    origin_ = kiv::LocalRepository::create(repositories_, originUser_);
    origin_->init(kiv::RepoType::Bare);
    for (int i = 0; i < 2; ++i) clones_[i] = kiv::LocalRepository::clone(origin_, kiv::RepoType::Regular);
    workspaces_[0] = clones_[0]->getWorkspace(users_[0]);
    workspaces_[0]->commitTransaction([&] {
      for (std::size_t i = 0; i < 1000; ++i) cards().makeCard(users_[0], i);
    });
    clones_[0]->synchronousPush(kiv::PushMode::TryPush);
    clones_[1]->synchronousPull();
    workspaces_[1] = clones_[1]->getWorkspace(users_[1]);
    kiv::loadContext(workspaces_[1]);
    for (int i = 0; i < 2; ++i) {
      workspaces_[i]->branch(u"start");
      workspaces_[i]->checkout(u"master");
    }
    for (std::size_t round = 0; round < rounds; ++round) {
      for (int i = 0; i < 2; ++i) editAndPush(i);
    }
  }

  // One commit of 10 changed cards in clone i's workspace, first brought up to its branch
  // (a push that merged first moved the branch past it).
  void edit(int i) {
    workspaces_[i]->updateContext();
    std::vector<ModelElement> all = users_[i]->getTopLevelElements();
    workspaces_[i]->commitTransaction([&] {
      for (std::size_t k = 0; k < 10; ++k) {
        ModelElement& card = all[(next_ + k * 97) % all.size()];
        card.setPropertyValue(cards().weight, Value::of(static_cast<int>(next_ + k)));
      }
    });
    ++next_;
  }
  void push(int i) { clones_[i]->synchronousPush(kiv::PushMode::MergeFirst); }
  void editAndPush(int i) {
    edit(i);
    push(i);
  }

  const Model& repositories() const { return repositories_; }
  const kiv::LocalRepository& clone(int i) const { return clones_[i]; }
  const kiv::Workspace& workspace(int i) const { return workspaces_[i]; }

 private:
  Model repositories_ = Model::create();
  Model originUser_ = Model::create();
  Model users_[2] = {Model::create(), Model::create()};
  kiv::LocalRepository origin_;
  kiv::LocalRepository clones_[2];
  kiv::Workspace workspaces_[2];
  std::size_t next_ = 0;
};

Ladder& ladder(std::size_t rounds) {
  static std::map<std::size_t, std::unique_ptr<Ladder>> made;
  std::unique_ptr<Ladder>& entry = made[rounds];
  if (!entry) entry = std::make_unique<Ladder>(rounds);
  return *entry;
}

Ladder& ladderOf(const benchmark::State& state) { return ladder(static_cast<std::size_t>(state.range(0))); }

void merge(benchmark::State& state) {
  Ladder& history = ladderOf(state);
  history.edit(0);
  history.edit(1);
  const kiv::Commit ours = history.clone(0)->getHead()->getTip();
  const kiv::Commit theirs = history.clone(1)->getHead()->getTip();
  const std::shared_ptr<kiv::IMergeStrategy> strategy = kiv::makeDefaultMergeStrategy();
  for (auto _ : state) {
    qf::zero::Transaction scratch = history.repositories()->beginTransaction();
    benchmark::DoNotOptimize(strategy->run(ours, theirs));
    scratch.cancel();
  }
  history.push(0);
  history.push(1);
}

// The part of a merge that walks the ladder: what the strategies read of the lowest
// common ancestors of the two tips.
void ancestors(benchmark::State& state) {
  Ladder& history = ladderOf(state);
  history.edit(0);
  history.edit(1);
  const kiv::Commit ours = history.clone(0)->getHead()->getTip();
  const kiv::Commit theirs = history.clone(1)->getHead()->getTip();
  for (auto _ : state) benchmark::DoNotOptimize(kiv::merge::summarizeLowestCommonAncestors(ours, theirs));
  history.push(0);
  history.push(1);
}

// Each iteration adds a rung; the iterations are few against the rounds already made.
void push(benchmark::State& state) {
  Ladder& history = ladderOf(state);
  for (auto _ : state) {
    state.PauseTiming();
    history.editAndPush(1);
    history.edit(0);
    state.ResumeTiming();
    history.push(0);
  }
}

void pull(benchmark::State& state) {
  Ladder& history = ladderOf(state);
  for (auto _ : state) {
    state.PauseTiming();
    history.editAndPush(0);
    state.ResumeTiming();
    history.clone(1)->synchronousPull();
  }
}

void checkout(benchmark::State& state) {
  Ladder& history = ladderOf(state);
  for (auto _ : state) {
    history.workspace(0)->checkout(u"start");
    history.workspace(0)->checkout(u"master");
  }
}

void undo(benchmark::State& state) {
  Ladder& history = ladderOf(state);
  history.edit(0);
  for (auto _ : state) {
    history.workspace(0)->undo();
    history.workspace(0)->redo();
  }
  history.push(0);
}

void rounds(benchmark::internal::Benchmark* benchmark) {
  benchmark->Arg(10)->Arg(50)->Arg(200)->ArgName("rounds")->Unit(benchmark::kMillisecond);
}

BENCHMARK(merge)->Apply(rounds);
BENCHMARK(ancestors)->Apply(rounds);
BENCHMARK(push)->Apply(rounds)->Iterations(5);
BENCHMARK(pull)->Apply(rounds)->Iterations(5);
BENCHMARK(checkout)->Apply(rounds);
BENCHMARK(undo)->Apply(rounds);

}  // namespace
