// Commit cost of a transaction that changes k elements of a model of N elements.
// The cost should follow k and not N: a commit touches only what changed.
// Arguments: N, k, and the batch size of the transactions that built the model (0: one
// transaction for all N).
//
// Cost of one transaction that creates m elements, each in a savepoint of its own and
// added to one folder's collection, as history records a commit's storages: the cost per
// element should not grow with m.
#include "qf/zero/core/meta/meta_registry.h"
#include "qf/zero/core/model_impl.h"
#include "qf/zero/core/reference_collection.h"

#include <benchmark/benchmark.h>

#include <map>

namespace {

using namespace qf::zero;

struct Counter {
  Model metaModel = Model::create();
  meta::Class item = meta::Class::create(metaModel, {}, u"Item", u"bench.Item", false);
  meta::Property count = meta::Property::create(metaModel, {}, u"count", meta::ValueFlags::Single, false);
  Counter() {
    item->setSuperclass(ModelElement::metaClass());
    count->setType(meta::MetaRegistry::getInstance().getPrimitiveType(u"Integer"));
    count->setPropertyIndex(1);
    item->addProperty(count);
  }
};

struct Folder {
  Model metaModel = Model::create();
  meta::Class folder = meta::Class::create(metaModel, {}, u"Folder", u"bench.Folder", false);
  meta::Class item = meta::Class::create(metaModel, {}, u"Item", u"bench.FolderItem", false);
  meta::Property items = meta::Property::create(metaModel, {}, u"items", meta::ValueFlags::Sequence, true);
  Folder() {
    folder->setSuperclass(ModelElement::metaClass());
    item->setSuperclass(ModelElement::metaClass());
    items->setType(item);
    items->setPropertyIndex(1);
    items->setIsUnique(true);
    folder->addProperty(items);
  }
};

struct ReportCounter : Listener {
  std::size_t modified = 0;
  void transactionCommitted(const std::shared_ptr<ShallowChangeReport<ModelElement>>& report) {
    modified += report->getModified().size();
  }
};

void commitOfKChangesInModelOfN(benchmark::State& state) {
  const auto n = static_cast<std::size_t>(state.range(0));
  const auto k = static_cast<std::size_t>(state.range(1));
  static Counter counter;
  Model model = Model::create();
  std::vector<ModelElement> items;
  // The model is built in transactions of `batch` creations. One huge transaction
  // leaves many small blocks freed at once, which the allocator keeps paying for.
  const auto batch = state.range(2) == 0 ? n : static_cast<std::size_t>(state.range(2));
  for (std::size_t first = 0; first < n; first += batch) {
    Transaction t = model->beginTransaction();
    for (std::size_t i = first; i < std::min(n, first + batch); ++i)
      items.push_back(counter.item.instantiate(model));
    t.commit();
  }
  ReportCounter listener;
  model->addShallowListener(&listener);
  int round = 0;
  for (auto _ : state) {
    ++round;
    Transaction t = model->beginTransaction();
    for (std::size_t i = 0; i < k; ++i)
      items[(i * 7919 + static_cast<std::size_t>(round)) % n].setPropertyValue(counter.count,
                                                                               Value::of(round));
    t.commit();
  }
  model->removeListener(&listener);
  state.counters["per_change_ns"] = benchmark::Counter(
      static_cast<double>(k), benchmark::Counter::kIsIterationInvariantRate | benchmark::Counter::kInvert);
  benchmark::DoNotOptimize(listener.modified);
}

BENCHMARK(commitOfKChangesInModelOfN)
    ->ArgsProduct({{1000, 10000, 100000}, {1, 10, 100}, {1000}})
    ->Args({100000, 100, 0})
    ->ArgNames({"N", "k", "batch"})
    ->Unit(benchmark::kMicrosecond);

// One transaction creating m elements into one folder's collection, each creation in a
// savepoint of its own or all at the outermost level.
void createMInOneTransaction(benchmark::State& state, bool savepoints) {
  const auto m = static_cast<std::size_t>(state.range(0));
  static Folder meta;
  for (auto _ : state) {
    Model model = Model::create();
    Transaction outer = model->beginTransaction();
    const ModelElement folder = meta.folder.instantiate(model);
    auto* items = folder.getPropertyValue(meta.items).getValue<ReferenceCollection*>();
    for (std::size_t i = 0; i < m; ++i) {
      if (savepoints) {
        Transaction savepoint = model->beginTransaction();
        items->add(meta.item.instantiate(model));
        savepoint.commit();
      } else {
        items->add(meta.item.instantiate(model));
      }
    }
    outer.commit();
    state.PauseTiming();
    model = Model();  // freeing the model is not what is measured
    state.ResumeTiming();
  }
  state.counters["per_element_ns"] = benchmark::Counter(
      static_cast<double>(m), benchmark::Counter::kIsIterationInvariantRate | benchmark::Counter::kInvert);
}

void createMInSavepointsOfOneTransaction(benchmark::State& state) { createMInOneTransaction(state, true); }
void createMWithoutSavepoints(benchmark::State& state) { createMInOneTransaction(state, false); }

BENCHMARK(createMInSavepointsOfOneTransaction)
    ->Arg(1000)
    ->Arg(10000)
    ->Arg(100000)
    ->ArgName("m")
    ->Unit(benchmark::kMillisecond);
BENCHMARK(createMWithoutSavepoints)
    ->Arg(1000)
    ->Arg(10000)
    ->Arg(100000)
    ->ArgName("m")
    ->Unit(benchmark::kMillisecond);

}  // namespace
