// The scripted session of test_version_control.py, through the C++ API: the Python test
// runs the same steps through the module and compares what each step leaves. Prints one
// JSON document per line: {"step": ..., "document": <the user model>} after each step,
// then {"conflicts": [...]} of the property tool's merge.
#include "kiv/host_entry.h"
#include "kiv/kiv.h"
#include "qf/zero/core/meta/enum.h"
#include "qf/zero/core/meta/meta_registry.h"
#include "qf/zero/core/primitive_collection.h"
#include "qf/zero/core/text.h"
#include "qf/zero/io/json_serializer.h"
#include "qf/zero/io/serialization_output.h"

#include <boost/uuid/string_generator.hpp>
#include <boost/uuid/uuid_io.hpp>

#include <nlohmann/json.hpp>

#include <iostream>
#include <string>

using namespace qf::zero;

namespace {

// The same metamodel as the test's "parity" package: Card{title: String, points: Integer,
// tags: set of String}.
struct Cards {
  Model items = Model::create();
  meta::Class card;
  meta::Property title, points, tags;

  Cards() {
    auto& registry = meta::MetaRegistry::getInstance();
    meta::Package package = meta::Package::create(items, {}, u"/tests/python/parity", u"parity");
    card = meta::Class::create(items, {}, u"Card", u"parity.Card", false);
    card->setSuperclass(ModelElement::metaClass());
    const auto add = [&](const char16_t* name, meta::ValueFlags flags, const char16_t* type, int index) {
      meta::Property property = meta::Property::create(items, {}, name, flags, false);
      property->setType(registry.getPrimitiveType(type));
      property->setPropertyIndex(index);
      property->setLower(flags == meta::ValueFlags::Set ? 0 : 1);
      property->setUpper(flags == meta::ValueFlags::Set ? -1 : 1);
      property->setIsUnique(true);
      card->addProperty(property);
      return property;
    };
    title = add(u"title", meta::ValueFlags::Single, u"String", 1);
    points = add(u"points", meta::ValueFlags::Single, u"Integer", 2);
    tags = add(u"tags", meta::ValueFlags::Set, u"String", 3);
    package->addType(card);
    registry.registerRootPackage(package);
  }
};

Uuid idOf(int n) {
  return boost::uuids::string_generator()("00000000-0000-4000-8000-00000000000" + std::to_string(n));
}

void show(const char* step, const Model& user) {
  nlohmann::ordered_json document;
  io::JSONSerializer().serialize(user, io::SerializationOutput::forIntermediateFormat(&document));
  std::cout << nlohmann::ordered_json{{"step", step}, {"document", document}}.dump() << "\n";
}

}  // namespace

int main() {
  HXInitialize_kiv();
  const Cards cards;
  const Model repositories = Model::create();
  const Model user = Model::create();
  const kiv::LocalRepository repository = kiv::LocalRepository::create(repositories, user);
  repository->init(kiv::RepoType::Regular);
  const kiv::Workspace workspace = repository->getWorkspace(user);
  const auto text = [](const char16_t* value) { return Value::of(std::u16string(value)); };
  const auto card = [&](int n) { return user->findElement(idOf(n)); };

  workspace->commitTransaction([&] {
    for (int n = 1; n <= 3; ++n) {
      ModelElement made = cards.card.instantiate(user, idOf(n));
      made.setPropertyValue(cards.title, text(n == 1 ? u"Login" : n == 2 ? u"Search" : u"Export"));
      made.setPropertyValue(cards.points, Value::of(n));
    }
  });
  show("three cards", user);
  workspace->commitTransaction([&] {
    card(1).setPropertyValue(cards.points, Value::of(8));
    card(3).destroy();
  });
  show("edit and delete", user);
  workspace->undo();
  show("undo", user);
  workspace->redo();
  show("redo", user);
  workspace->branch(u"side");
  workspace->checkout(u"side");
  workspace->commitTransaction([&] {
    card(1).setPropertyValue(cards.title, text(u"Sign in"));
    card(2).getPropertyValue(cards.tags).getValue<PrimitiveCollection*>()->genericAdd(text(u"backend"));
  });
  show("side edits", user);
  workspace->checkout(u"master");
  show("back on master", user);
  workspace->commitTransaction([&] {
    card(1).setPropertyValue(cards.title, text(u"Log in"));
    card(2).setPropertyValue(cards.points, Value::of(5));
  });
  show("master edits", user);

  auto owned = std::make_unique<kiv::PropertyMergeTool>();
  const kiv::PropertyMergeTool& tool = *owned;
  {
    Transaction transaction = repositories->beginTransaction();
    repository->setIMergeStrategy(std::make_shared<kiv::RecursiveMerge3Strategy>(std::move(owned)));
    transaction.commit();
  }
  workspace->merge(u"side");
  show("merged", user);
  nlohmann::ordered_json conflicts = nlohmann::ordered_json::array();
  for (const kiv::MergeConflict& conflict : tool.conflicts()) {
    conflicts.push_back({{"element", boost::uuids::to_string(conflict.element)},
                         {"type", conflict.type},
                         {"property", conflict.property},
                         {"kind", std::string(kiv::toString(conflict.kind))},
                         {"base", conflict.base},
                         {"ours", conflict.ours},
                         {"theirs", conflict.theirs},
                         {"merged", conflict.merged}});
  }
  std::cout << nlohmann::ordered_json{{"conflicts", conflicts}}.dump() << "\n";
  HXTerminate_kiv();
  return 0;
}
