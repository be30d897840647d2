// Generated element classes against run-time (dynamic) elements of an equivalent class:
// a changing transaction of k setter calls, through the typed setter, the reflective
// setter of a generated class, and the reflective setter of a dynamic class. The
// typed path should cost no more than the reflective ones, and generated storages
// (typed old-value slots) no more than the generic ones.
#include "kiv/metamodel/commit_impl.h"
#include "kiv/metamodel/meta_package_kiv.h"
#include "qf/zero/core/meta/meta_registry.h"
#include "qf/zero/core/model_impl.h"

#include <benchmark/benchmark.h>

#include <string>
#include <vector>

namespace {

using namespace qf::zero;

// A run-time class with the two text properties of a commit that the loops change.
struct DynamicCommit {
  Model metaModel = Model::create();
  meta::Class cls = meta::Class::create(metaModel, {}, u"Commit", u"bench.Commit", false);
  meta::Property user = meta::Property::create(metaModel, {}, u"user", meta::ValueFlags::Single, false);
  DynamicCommit() {
    cls->setSuperclass(ModelElement::metaClass());
    user->setType(meta::MetaRegistry::getInstance().getPrimitiveType(u"String"));
    user->setPropertyIndex(1);
    cls->addProperty(user);
  }
};

enum class Path { Typed, ReflectiveGenerated, ReflectiveDynamic };

void setUserOnKElements(benchmark::State& state, Path path) {
  const auto k = static_cast<std::size_t>(state.range(0));
  static DynamicCommit dynamic;
  const auto& package = kiv::MetaPackageKiv::getInstance();
  Model model = Model::create();
  std::vector<ModelElement> elements;
  {
    Transaction t = model->beginTransaction();
    for (std::size_t i = 0; i < k; ++i) {
      elements.push_back(path == Path::ReflectiveDynamic ? dynamic.cls.instantiate(model)
                                                         : ModelElement(kiv::Commit::create(model)));
    }
    t.commit();
  }
  const meta::Property& user = path == Path::ReflectiveDynamic ? dynamic.user : package.getCommit_user();
  std::vector<kiv::Commit> commits;
  for (const ModelElement& element : elements) commits.push_back(elementCast<kiv::Commit>(element));
  const std::u16string names[2] = {u"ann", u"bob"};
  std::size_t round = 0;
  for (auto _ : state) {
    const std::u16string& name = names[++round % 2];
    const Value value = Value::of(name);
    Transaction t = model->beginTransaction();
    if (path == Path::Typed) {
      for (const kiv::Commit& commit : commits) commit->setUser(name);
    } else {
      for (ModelElement& element : elements) element.setPropertyValue(user, value);
    }
    t.commit();
  }
  state.SetItemsProcessed(static_cast<std::int64_t>(state.iterations() * k));
}

void typedGetters(benchmark::State& state) {
  Model model = Model::create();
  const kiv::Commit commit = kiv::Commit::Builder(model).doSetUser(u"ann").create();
  for (auto _ : state) benchmark::DoNotOptimize(commit.getUser().size());
}

void reflectiveGetters(benchmark::State& state) {
  Model model = Model::create();
  const kiv::Commit commit = kiv::Commit::Builder(model).doSetUser(u"ann").create();
  const meta::Property& user = kiv::MetaPackageKiv::getInstance().getCommit_user();
  for (auto _ : state) benchmark::DoNotOptimize(commit.getPropertyValue(user));
}

BENCHMARK_CAPTURE(setUserOnKElements, typed, Path::Typed)->Arg(100)->Arg(10000);
BENCHMARK_CAPTURE(setUserOnKElements, reflective_generated, Path::ReflectiveGenerated)->Arg(100)->Arg(10000);
BENCHMARK_CAPTURE(setUserOnKElements, reflective_dynamic, Path::ReflectiveDynamic)->Arg(100)->Arg(10000);
BENCHMARK(typedGetters);
BENCHMARK(reflectiveGetters);

}  // namespace
