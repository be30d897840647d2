// Writing and reading whole models as JSON documents, against nlohmann's own dump
// and parse of the same document: the ratios say what the model layer costs on top
// of the JSON library. Argument: the number of elements. parseJsonText is the framework's
// own parse of nlohmann's text, against nlohmannParse.
#include "qf/zero/core/json_parse.h"
#include "qf/zero/core/meta/meta_registry.h"
#include "qf/zero/core/model_impl.h"
#include "qf/zero/core/primitive_collection.h"
#include "qf/zero/core/reference_collection.h"
#include "qf/zero/io/json_parser.h"
#include "qf/zero/io/json_serializer.h"

#include <benchmark/benchmark.h>

#include <nlohmann/json.hpp>

#include <map>
#include <random>
#include <string>

namespace {

using namespace qf::zero;
using nlohmann::ordered_json;

// Parts in an eight-way containment tree, each with a name, a number, two tags and a
// link to another part.
struct Parts {
  Model metaModel = Model::create();
  meta::Package package = meta::Package::create(metaModel, {}, u"/bench/parts", u"parts");
  meta::Class part = meta::Class::create(metaModel, {}, u"Part", u"parts.Part", false);
  meta::Property name, count, tags, children, parent, link;

  Parts() {
    auto& registry = meta::MetaRegistry::getInstance();
    part->setSuperclass(ModelElement::metaClass());
    auto add = [&](const char16_t* n, meta::ValueFlags flags, bool composite, const meta::Type& type,
                   int index) {
      meta::Property p = meta::Property::create(metaModel, {}, n, flags, composite);
      p->setType(type);
      p->setPropertyIndex(index);
      part->addProperty(p);
      return p;
    };
    name = add(u"name", meta::ValueFlags::Single, false, registry.getPrimitiveType(u"String"), 1);
    count = add(u"count", meta::ValueFlags::Single, false, registry.getPrimitiveType(u"Integer"), 2);
    tags = add(u"tags", meta::ValueFlags::Set, false, registry.getPrimitiveType(u"String"), 3);
    children = add(u"children", meta::ValueFlags::Sequence, true, part, 4);
    parent = add(u"parent", meta::ValueFlags::Optional, false, part, 5);
    link = add(u"link", meta::ValueFlags::Optional, false, part, 6);
    children->setOpposite(parent);
    parent->setOpposite(children);
    package->addType(part);
    registry.registerRootPackage(package);
  }

  Model build(std::size_t n) const {
    Model model = Model::create();
    std::vector<ModelElement> all;
    all.reserve(n);
    std::mt19937 random(42);
    Transaction t = model->beginTransaction();
    for (std::size_t i = 0; i < n; ++i) {
      ModelElement e = part.instantiate(model);
      const std::string digits = std::to_string(i);  // one string: both iterators must point into it
      e.setPropertyValue(name, Value::of(u"part-" + std::u16string(digits.begin(), digits.end())));
      e.setPropertyValue(count, Value::of(static_cast<int>(i)));
      auto* tagSet = e.getPropertyValue(tags).getValue<PrimitiveCollection*>();
      tagSet->genericAdd(Value::of(std::u16string(u"tag") + char16_t(u'a' + i % 7)));
      tagSet->genericAdd(Value::of(std::u16string(u"common")));
      if (i > 0) all[(i - 1) / 8].getPropertyValue(children).getValue<ReferenceCollection*>()->add(e);
      if (i > 1)
        e.setPropertyValue(link, Value::createElementValue(
                                     all[std::uniform_int_distribution<std::size_t>(0, i - 1)(random)]));
      all.push_back(e);
    }
    t.commit();
    return model;
  }
};

const Parts& parts() {
  static const Parts instance;
  return instance;
}

const Model& modelOf(std::size_t n) {
  // The metamodel first: statics are destroyed in reverse order, and a model's teardown
  // needs its classes.
  const Parts& metamodel = parts();
  static std::map<std::size_t, Model> models;
  auto it = models.find(n);
  if (it == models.end()) it = models.emplace(n, metamodel.build(n)).first;
  return it->second;
}

ordered_json documentOf(const Model& model) {
  ordered_json document;
  io::JSONSerializer().serialize(model, io::SerializationOutput::forIntermediateFormat(&document));
  return document;
}

void serializeModel(benchmark::State& state) {
  const Model& model = modelOf(static_cast<std::size_t>(state.range(0)));
  for (auto _ : state) benchmark::DoNotOptimize(documentOf(model));
  state.SetItemsProcessed(state.iterations() * state.range(0));
}

void parseModel(benchmark::State& state) {
  const ordered_json document = documentOf(modelOf(static_cast<std::size_t>(state.range(0))));
  for (auto _ : state) {
    Model copy = Model::create();
    io::JSONParser().parseVerbatim(document, copy);
    state.PauseTiming();
    copy = Model();
    state.ResumeTiming();
  }
  state.SetItemsProcessed(state.iterations() * state.range(0));
}

void nlohmannDump(benchmark::State& state) {
  const ordered_json document = documentOf(modelOf(static_cast<std::size_t>(state.range(0))));
  for (auto _ : state) benchmark::DoNotOptimize(document.dump());
  state.SetItemsProcessed(state.iterations() * state.range(0));
}

void nlohmannParse(benchmark::State& state) {
  const std::string text = documentOf(modelOf(static_cast<std::size_t>(state.range(0)))).dump();
  for (auto _ : state) benchmark::DoNotOptimize(ordered_json::parse(text));
  state.SetItemsProcessed(state.iterations() * state.range(0));
}

// The framework's own parse of the same text: the same document, built without copying the
// members an object already holds each time its member list grows.
void parseJsonText(benchmark::State& state) {
  const std::string text = documentOf(modelOf(static_cast<std::size_t>(state.range(0)))).dump();
  for (auto _ : state) benchmark::DoNotOptimize(parseJson(text));
  state.SetItemsProcessed(state.iterations() * state.range(0));
}

BENCHMARK(serializeModel)->Arg(10000)->Arg(100000)->Unit(benchmark::kMillisecond);
BENCHMARK(nlohmannDump)->Arg(10000)->Arg(100000)->Unit(benchmark::kMillisecond);
BENCHMARK(parseModel)->Arg(10000)->Arg(100000)->Unit(benchmark::kMillisecond);
// Each size of the two parses back to back: a run at 100k leaves the heap in a state that
// slows whatever comes after it.
BENCHMARK(nlohmannParse)->Arg(10000)->Unit(benchmark::kMillisecond);
BENCHMARK(parseJsonText)->Arg(10000)->Unit(benchmark::kMillisecond);
BENCHMARK(nlohmannParse)->Arg(100000)->Unit(benchmark::kMillisecond);
BENCHMARK(parseJsonText)->Arg(100000)->Unit(benchmark::kMillisecond);

}  // namespace
