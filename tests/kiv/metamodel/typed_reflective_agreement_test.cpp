// Typed and reflective access reach the same state, for every property of every class:
// one table of properties, the samples made from each property's type.
#include "kiv/metamodel/branch_impl.h"
#include "kiv/metamodel/commit_impl.h"
#include "kiv/metamodel/delta_impl.h"
#include "kiv/metamodel/dependency_impl.h"
#include "kiv/metamodel/local_repository_impl.h"
#include "kiv/metamodel/meta_package_kiv.h"
#include "kiv/metamodel/object_storage_impl.h"
#include "kiv/metamodel/protocol/history_impl.h"
#include "kiv/metamodel/remote_repository_impl.h"
#include "kiv/metamodel/workspace_impl.h"
#include "qf/zero/core/meta/meta_registry.h"
#include "qf/zero/core/model_impl.h"
#include "qf/zero/core/text.h"

#include <boost/date_time/posix_time/posix_time.hpp>

#include <gtest/gtest.h>

#include <nlohmann/json.hpp>

#include <functional>
#include <set>
#include <type_traits>

namespace {

using qf::zero::AbstractOwnedCollection;
using qf::zero::Model;
using qf::zero::ModelElement;
using qf::zero::Value;
namespace meta = qf::zero::meta;

template <class C>
C as(const ModelElement& element) {
  return qf::zero::elementCast<C>(element);
}

template <class T>
Value wrap(const T& value) {
  return Value::of(value);
}
template <class T>
Value wrap(const boost::optional<T>& value) {
  return value ? Value::of(*value) : Value();
}

// A non-null pointer that owns nothing: pointer properties only store and compare it.
template <class T>
std::shared_ptr<T> fakePointer() {
  static int anchor;
  return std::shared_ptr<T>(std::shared_ptr<void>(), reinterpret_cast<T*>(&anchor));
}

struct Row {
  std::u16string property;  // qualified name
  std::function<Value(const ModelElement&)> typedGet;
  // Single-valued: the typed setter. Many-valued: null.
  std::function<void(const ModelElement&, const Value&)> typedSet;
};

#define SINGLE(C, qualified, prop, Prop)                                                        \
  Row {                                                                                         \
    u"" qualified "." #prop, [](const ModelElement& e) { return wrap(as<C>(e)->get##Prop()); }, \
        [](const ModelElement& e, const Value& v) {                                             \
          auto typed = as<C>(e);                                                                \
          typed->set##Prop(v.getValue<std::decay_t<decltype(typed->get##Prop())>>());           \
        }                                                                                       \
  }

#define MANY(C, qualified, prop, Prop)                                                           \
  Row {                                                                                          \
    u"" qualified "." #prop,                                                                     \
        [](const ModelElement& e) {                                                              \
          return Value::of(static_cast<const AbstractOwnedCollection*>(&as<C>(e)->get##Prop())); \
        },                                                                                       \
        nullptr                                                                                  \
  }

const std::vector<Row>& rows() {
  static const std::vector<Row> table = {
      MANY(kiv::Branch, "kiv.Branch", redoStack, RedoStack),
      SINGLE(kiv::Branch, "kiv.Branch", name, Name),
      SINGLE(kiv::Branch, "kiv.Branch", tip, Tip),
      SINGLE(kiv::Branch, "kiv.Branch", repository, Repository),
      SINGLE(kiv::Commit, "kiv.Commit", delta, Delta),
      SINGLE(kiv::Commit, "kiv.Commit", user, User),
      SINGLE(kiv::Commit, "kiv.Commit", message, Message),
      SINGLE(kiv::Commit, "kiv.Commit", dateTime, DateTime),
      MANY(kiv::Commit, "kiv.Commit", parents, Parents),
      MANY(kiv::Delta, "kiv.Delta", previous, Previous),
      MANY(kiv::Delta, "kiv.Delta", current, Current),
      SINGLE(kiv::Delta, "kiv.Delta", isSnapshot, IsSnapshot),
      MANY(kiv::Dependency, "kiv.Dependency", oldestCommits, OldestCommits),
      SINGLE(kiv::Dependency, "kiv.Dependency", depth, Depth),
      SINGLE(kiv::Dependency, "kiv.Dependency", isSnapshot, IsSnapshot),
      MANY(kiv::Dependency, "kiv.Dependency", newestCommits, NewestCommits),
      SINGLE(kiv::Dependency, "kiv.Dependency", repository, Repository),
      SINGLE(kiv::Repository, "kiv.Repository", head, Head),
      MANY(kiv::Repository, "kiv.Repository", branches, Branches),
      SINGLE(kiv::Repository, "kiv.Repository", name, Name),
      SINGLE(kiv::Repository, "kiv.Repository", uri, Uri),
      SINGLE(kiv::Repository, "kiv.Repository", isBare, IsBare),
      SINGLE(kiv::Repository, "kiv.Repository", packetTransport, PacketTransport),
      MANY(kiv::Repository, "kiv.Repository", observers, Observers),
      SINGLE(kiv::Repository, "kiv.Repository", numRemoteObservers, NumRemoteObservers),
      SINGLE(kiv::Repository, "kiv.Repository", repositoryListener, RepositoryListener),
      SINGLE(kiv::LocalRepository, "kiv.LocalRepository", origin, Origin),
      MANY(kiv::LocalRepository, "kiv.LocalRepository", pulRequests, PulRequests),
      SINGLE(kiv::LocalRepository, "kiv.LocalRepository", IMergeStrategy, IMergeStrategy),
      SINGLE(kiv::LocalRepository, "kiv.LocalRepository", ws, Ws),
      SINGLE(kiv::ObjectStorage, "kiv.ObjectStorage", elementUUID, ElementUUID),
      SINGLE(kiv::ObjectStorage, "kiv.ObjectStorage", content, Content),
      SINGLE(kiv::Workspace, "kiv.Workspace", commitProducer, CommitProducer),
      SINGLE(kiv::Workspace, "kiv.Workspace", ctx, Ctx),
      SINGLE(kiv::Workspace, "kiv.Workspace", repository, Repository),
      MANY(kiv::protocol::History, "kiv.protocol.History", previous, Previous),
      MANY(kiv::protocol::History, "kiv.protocol.History", current, Current),
      MANY(kiv::protocol::History, "kiv.protocol.History", commits, Commits),
      MANY(kiv::protocol::History, "kiv.protocol.History", deltas, Deltas),
      MANY(kiv::protocol::History, "kiv.protocol.History", objectStorages, ObjectStorages),
  };
  return table;
}

// An element of `type` (a concrete stand-in for an abstract class) in `model`.
ModelElement instanceOf(const meta::Type& type, const Model& model) {
  meta::Class cls = qf::zero::elementCast<meta::Class>(type);
  if (cls->isAbstract()) cls = kiv::LocalRepository::metaClass();
  return cls.instantiate(model);
}

// A value of the property's type other than its default: a new element for
// references, an item for many-valued properties.
Value sampleOf(const meta::Property& property, const Model& model) {
  if (property->isReference())
    return Value::createElementValue(instanceOf(property->getType(), model), property);
  const std::u16string type = property->getType().getQualifiedName();
  if (type == u"String") return Value::of(std::u16string(u"sample"));
  if (type == u"Boolean") return Value::of(true);
  if (type == u"Integer") return Value::of(42);
  if (type == u"UUID") return Value::of(qf::zero::generateNewUuid());
  if (type == u"DateTime") return Value::of(boost::posix_time::time_from_string("2026-11-21 10:30:00"));
  if (type == u"JsonValue") return Value::of(qf::zero::JsonValue{{"answer", 42}});
  if (type == u"kiv.PacketTransportPtr") return Value::of(fakePointer<qf::zero::io::PacketTransport>());
  if (type == u"kiv.RepositoryListenerPtr") return Value::of(fakePointer<kiv::RepositoryListener>());
  if (type == u"kiv.IMergeStrategyPtr") return Value::of(fakePointer<kiv::IMergeStrategy>());
  if (type == u"kiv.CommitProducerPtr") return Value::of(fakePointer<kiv::CommitProducer>());
  ADD_FAILURE() << "no sample for type " << qf::zero::toUtf8(type);
  return {};
}

meta::Property propertyNamed(const std::u16string& qualified) {
  const auto dot = qualified.rfind(u'.');
  const meta::Class owner = meta::MetaRegistry::getInstance().getClass(qualified.substr(0, dot));
  return owner ? owner->findProperty(qualified.substr(dot + 1)) : meta::Property();
}

TEST(GeneratedAccess, TypedAndReflectiveAccessAgreeForEveryProperty) {
  kiv::MetaPackageKiv::getInstance();
  std::set<std::u16string> covered;
  for (const Row& row : rows()) {
    SCOPED_TRACE(qf::zero::toUtf8(row.property));
    const meta::Property property = propertyNamed(row.property);
    ASSERT_TRUE(property);
    covered.insert(row.property);
    Model model = Model::create();
    const Value sample = sampleOf(property, model);

    // A builder sets the first value, even of read-only properties.
    auto builder = instanceOf(property->getOwningType(), model).getMetaClass()->instantiateBuilder(model);
    builder->setOrAdd(property, sample);
    ModelElement element = builder->create();

    if (property->isMany()) {
      const auto* view = element.getPropertyValue(property).getValue<AbstractOwnedCollection*>();
      EXPECT_EQ(row.typedGet(element), Value::of(static_cast<const AbstractOwnedCollection*>(view)));
      EXPECT_EQ(view->size(), 1u);
      EXPECT_EQ(view->genericAt(0), sample);
      continue;
    }
    EXPECT_EQ(row.typedGet(element), sample);
    EXPECT_EQ(element.getPropertyValue(property), sample);
    // The key a map would file the element under, read from the member or through a Value.
    EXPECT_EQ(element->basicGetMapKey(property), qf::zero::mapKeyFromValue(element->basicGetValue(property)));
    if (property->isReadOnly()) continue;

    element.setPropertyValue(property, Value());
    EXPECT_EQ(row.typedGet(element), element.getPropertyValue(property));
    EXPECT_EQ(element.getPropertyValue(property), property->getDefaultValue());
    row.typedSet(element, sample);
    EXPECT_EQ(element.getPropertyValue(property), sample);
  }

  // The table lists every property of every class.
  std::set<std::u16string> all;
  for (const meta::Type& type : kiv::MetaPackageKiv::getInstance().getKivPackage()->getTypes()) {
    if (auto cls = qf::zero::elementCast<meta::Class>(type)) {
      for (const meta::Property& p : cls->getOwnProperties()) all.insert(p.getQualifiedName());
    }
  }
  for (const meta::Property& p : kiv::protocol::History::metaClass()->getOwnProperties()) {
    all.insert(p.getQualifiedName());
  }
  EXPECT_EQ(covered, all);
}

}  // namespace
