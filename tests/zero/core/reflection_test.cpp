// Values, the registry, operations, builders, proxies and instance queries.
#include "qf/zero/core/builder.h"
#include "qf/zero/core/messages.h"
#include "qf/zero/core/meta/framework_package.h"
#include "qf/zero/core/meta/meta_registry.h"
#include "support/test_metamodel.h"

#include <gtest/gtest.h>

namespace qf::zero {
namespace {

using foundation::core::except::Exception;
namespace msg = qf0::messages;

class Reflection : public ::testing::Test {
 protected:
  support::TestMetamodel tm;
  Model model = Model::create();
};

TEST_F(Reflection, ValuesCastOnlyToWhatTheyHoldAndNameTheTypeAskedFor) {
  const Value number = Value::of(5);
  EXPECT_EQ(number.getValue<int>(), 5);
  try {
    number.getValue<std::u16string>();
    FAIL() << "expected CannotCastIncompatibleTypes";
  } catch (const Exception<msg::CannotCastIncompatibleTypes>& e) {
    EXPECT_EQ(std::get<std::u16string>(e.GetBaseMsgIDObj().arguments().at(0)), u"String");
  }
  ModelElement leaf = tm.leaf.instantiate(model);
  const Value element = Value::createElementValue(leaf);
  EXPECT_EQ(element.getValue<ModelElement>(), leaf);
  EXPECT_THROW(element.getValue<meta::Class>(), Exception<msg::CannotCastIncompatibleTypes>);
  EXPECT_THROW(element.checkCompatible<int>(), Exception<msg::CannotCastIncompatibleTypes>);
  EXPECT_FALSE(Value().getValue<boost::optional<Uuid>>());
  EXPECT_EQ(*Value::of(Uuid{}).getValue<boost::optional<Uuid>>(), Uuid{});
  EXPECT_TRUE(Value::of(std::u16string(u"a")) == Value::of(std::u16string(u"a")));
  EXPECT_FALSE(Value::of(1) == Value::of(true));
}

TEST_F(Reflection, RegistryKnowsTheFrameworkTypesAndRegisteredPackages) {
  auto& registry = meta::MetaRegistry::getInstance();
  for (const char16_t* name :
       {u"String", u"Boolean", u"Integer", u"UUID", u"DateTime", u"JsonValue", u"HxArray"}) {
    EXPECT_TRUE(registry.getPrimitiveType(name)) << toUtf8(name);
  }
  EXPECT_EQ(registry.getClass(u"ModelElement"), ModelElement::metaClass());
  EXPECT_EQ(registry.getClass(u"Model"), Model::metaClass());
  EXPECT_EQ(registry.getClass(u"tm.Leaf"), tm.leaf);
  EXPECT_FALSE(registry.getClass(u"tm.Missing"));
  EXPECT_EQ(registry.getRootPackage(u"/test/tm"), tm.package);
  Model other = Model::create();
  meta::Class clash = meta::Class::create(other, {}, u"Node", u"tm.Node", false);
  EXPECT_THROW(registry.registerType(clash), Exception<msg::TypeAlreadyRegistered>);
  EXPECT_EQ(tm.count.getQualifiedName(), u"tm.Node.count");
}

// A class is built by the factory registered for that very class: a class registered later
// under the same name does not inherit it, and unregistering drops it.
TEST_F(Reflection, AClassIsBuiltByTheFactoryRegisteredForItOnly) {
  auto& registry = meta::MetaRegistry::getInstance();
  const Model metamodel = Model::create();
  int built = 0;
  const auto countingFactory = [&built](const meta::Class& type) {
    return [&built, type](const Model& target) {
      ++built;
      return std::make_unique<DynamicElementBuilder>(type, target);
    };
  };
  const meta::Class first = meta::Class::create(metamodel, {}, u"Lamp", u"registry.Lamp", false);
  registry.registerType(first, {}, countingFactory(first));
  EXPECT_EQ(first.instantiate(model).getMetaClass(), first);
  EXPECT_EQ(built, 1);
  registry.unregisterType(first);
  EXPECT_EQ(first.instantiate(model).getMetaClass(), first);
  EXPECT_EQ(built, 1) << "an unregistered class is built as a dynamic element";

  const meta::Class second = meta::Class::create(metamodel, {}, u"Lamp", u"registry.Lamp", false);
  registry.registerType(second);
  EXPECT_EQ(second.instantiate(model).getMetaClass(), second);
  EXPECT_EQ(built, 1) << "the factory was the first class's, not its name's";
  registry.registerType(second, {}, countingFactory(second));
  second.instantiate(model);
  EXPECT_EQ(built, 2) << "a factory given to a registered class is used from then on";
  registry.unregisterType(second);
}

TEST_F(Reflection, InvokeCallsTheInvokerWithCheckedArguments) {
  meta::Operation twice = meta::Operation::create(tm.metaModel, {}, u"twice");
  twice->addArgument(meta::Argument::create(tm.metaModel, {}, u"n"));
  twice->setInvoker(
      std::make_unique<meta::FunctionInvoker>([](ModelElement::Impl&, std::vector<Value>& args) {
        return Value::of(2 * args.at(0).getValue<int>());
      }));
  meta::Operation bare = meta::Operation::create(tm.metaModel, {}, u"bare");
  ModelElement a = tm.node.instantiate(model);
  EXPECT_EQ(a.invoke(twice, {Value::of(21)}).getValue<int>(), 42);
  EXPECT_THROW(a.invoke(twice, {}), Exception<msg::WrongArgumentCount>);
  EXPECT_THROW(a.invoke(bare, {}), Exception<msg::NoSuchOperation>);
}

TEST_F(Reflection, OrchestratorCreatesElementsThatReferToEachOtherInOneStep) {
  ModelElement::Builder::Orchestrator orchestrator(model);
  auto* parent = orchestrator.addBuilder(tm.node->instantiateBuilder(model));
  auto* child = orchestrator.addBuilder(tm.node->instantiateBuilder(model));
  child->setOrAddReference(tm.best, parent);
  parent->setOrAddReference(tm.friends, child);
  parent->setOrAdd(tm.children, tm.leaf->instantiateBuilder(model));
  orchestrator.commit();
  const ModelElement p = orchestrator.getCreatedElement(parent), c = orchestrator.getCreatedElement(child);
  EXPECT_EQ(c.getPropertyValue(tm.best).getElement(), p);
  EXPECT_TRUE(tm.refs(c, tm.friends)->contains(p));
  ASSERT_EQ(tm.refs(p, tm.children)->size(), 1u);
  EXPECT_EQ(tm.refs(p, tm.children)->getAllValues()[0].getMetaClass(), tm.leaf);
}

TEST_F(Reflection, AFailingBuilderLeavesNothingBehind) {
  auto builder = tm.node->instantiateBuilder(model);
  builder->setOrAdd(tm.children, tm.leaf->instantiateBuilder(model));
  builder->setOrAdd(tm.count, Value::of(std::u16string(u"not a number")));
  EXPECT_THROW(builder->create(), Exception<msg::InvalidValue>);
  EXPECT_EQ(model->getElementCount(), 0u);
  auto orphan = tm.node->instantiateBuilder(Model());
  EXPECT_THROW(orphan->create(), Exception<msg::CannotCreateWithoutModel>);
}

TEST_F(Reflection, ProxiesStandInUntilTheirElementIsResident) {
  const Uuid id = generateNewUuid();
  ModelElement holder = tm.node.instantiate(model);
  ModelElement proxy = ModelElement::Impl::createProxy(model.getImpl(), tm.node, ProxyId{id, {}});
  EXPECT_TRUE(proxy.isProxy());
  EXPECT_THROW(proxy.setPropertyValue(tm.count, Value::of(1)), Exception<msg::CannotModifyProxy>);
  auto* friends = tm.refs(holder, tm.friends);
  friends->basicAddWithProxy(proxy);
  EXPECT_TRUE(friends->basicContainsProxyTo(ProxyId{id, {}}));
  EXPECT_FALSE(model->peekResolveProxy(holder.getImpl(), proxy));
  EXPECT_THROW(model->resolveProxy(holder.getImpl(), proxy), Exception<msg::CannotResolveProxy>);

  ModelElement resident = tm.node.instantiate(model, id);
  EXPECT_EQ(model->peekResolveProxy(holder.getImpl(), proxy), resident);
  EXPECT_EQ(friends->getAllValues(), (std::vector<ModelElement>{resident}));
  friends->resolveAll();
  EXPECT_EQ(friends->getAllValuesAndProxies(), (std::vector<ModelElement>{resident}));

  model->setProxyLoader(
      [&](ModelImpl& m, const ProxyId& pid) { return tm.node.instantiate(Model(&m), pid.elementId); });
  ModelElement later =
      ModelElement::Impl::createProxy(model.getImpl(), tm.node, ProxyId{generateNewUuid(), {}});
  EXPECT_EQ(model->resolveProxy(holder.getImpl(), later).getUuid(), later.getUuid());
}

TEST_F(Reflection, InstanceQueriesFollowTheClassHierarchyInCreationOrder) {
  ModelElement n1 = tm.node.instantiate(model), l1 = tm.leaf.instantiate(model),
               n2 = tm.node.instantiate(model);
  EXPECT_EQ(model->getInstances(tm.node, query::SearchClassMatchMode::IncludeSubclasses),
            (std::vector<ModelElement>{n1, l1, n2}));
  EXPECT_EQ(model->getInstances(tm.node, query::SearchClassMatchMode::ExactClass),
            (std::vector<ModelElement>{n1, n2}));
  l1.destroy();
  EXPECT_TRUE(model->getInstances(tm.leaf, query::SearchClassMatchMode::ExactClass).empty());
}

TEST_F(Reflection, QueriesFilterTheInstancesOfTheirAttachedClasses) {
  ModelElement n1 = tm.node.instantiate(model), l1 = tm.leaf.instantiate(model),
               n2 = tm.node.instantiate(model);
  tm.setName(n2, u"keep");
  tm.setName(l1, u"keep");
  query::PredicateQuery named(model, [&](const ModelElement& e) {
    return e.getPropertyValue(tm.name).getValue<std::u16string>() == u"keep";
  });
  EXPECT_TRUE(named.evaluate().empty()) << "a query without attachments ranges over nothing";
  {
    ModelElement::Constrainables everything(named);
    ModelElement::Constrainables leaves(named, tm.leaf, query::SearchClassMatchMode::ExactClass);
    EXPECT_EQ(leaves.getInstances(), (std::vector<ModelElement>{l1}));
    EXPECT_EQ(named.evaluate(), (std::vector<ModelElement>{l1, n2}))
        << "overlapping attachments list each once";
  }
  EXPECT_TRUE(named.evaluate().empty()) << "an attachment leaves its query when it goes";
}

}  // namespace
}  // namespace qf::zero
