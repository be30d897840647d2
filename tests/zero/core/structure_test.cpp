// Containment, opposites, map keys and property flags: what keeps a model consistent.
#include "qf/zero/core/builder.h"
#include "qf/zero/core/messages.h"
#include "qf/zero/core/meta/framework_package.h"
#include "support/test_metamodel.h"

#include <gtest/gtest.h>

namespace qf::zero {
namespace {

using foundation::core::except::Exception;
namespace msg = qf0::messages;

class Structure : public ::testing::Test {
 protected:
  support::TestMetamodel tm;
  Model model = Model::create();
  ModelElement make(const std::u16string& name = u"") {
    ModelElement e = tm.node.instantiate(model);
    if (!name.empty()) tm.setName(e, name);
    return e;
  }
};

TEST_F(Structure, MovingAChildUpdatesBothContainersAndTheBackReference) {
  ModelElement a = make(), b = make(), child = make();
  tm.refs(a, tm.children)->add(child);
  EXPECT_FALSE(child.isTopLevel());
  EXPECT_EQ(child.getPropertyValue(tm.parent).getElement(), a);
  tm.refs(b, tm.children)->add(child);
  EXPECT_FALSE(tm.refs(a, tm.children)->contains(child));
  EXPECT_EQ(child.container(), b);
  EXPECT_EQ(child.containmentFeature(), tm.children);
  child.setPropertyValue(tm.parent, Value());
  EXPECT_TRUE(child.isTopLevel());
  EXPECT_EQ(tm.refs(b, tm.children)->size(), 0u);
  // Top-level order is creation order, whatever the history.
  EXPECT_EQ(model->getTopLevelElements(), (std::vector<ModelElement>{a, b, child}));
}

TEST_F(Structure, ContainmentCyclesAreRefusedFromEitherEnd) {
  ModelElement a = make(), b = make();
  tm.refs(a, tm.children)->add(b);
  const std::string before = support::dumpModel(model);
  EXPECT_THROW(tm.refs(b, tm.children)->add(a), Exception<msg::CannotCreateCircularContainment>);
  EXPECT_THROW(a.setPropertyValue(tm.parent, Value::createElementValue(b)),
               Exception<msg::CannotCreateCircularContainment>);
  EXPECT_THROW(tm.refs(a, tm.children)->add(a), Exception<msg::CannotCreateCircularContainment>);
  EXPECT_EQ(before, support::dumpModel(model));
}

TEST_F(Structure, SymmetricOppositeIsKeptOnBothEnds) {
  ModelElement a = make(), b = make();
  tm.refs(a, tm.friends)->add(b);
  EXPECT_TRUE(tm.refs(b, tm.friends)->contains(a));
  tm.refs(b, tm.friends)->remove(a);
  EXPECT_FALSE(tm.refs(a, tm.friends)->contains(b));
}

TEST_F(Structure, DestroyRemovesTheSubtreeAndEveryReferenceToIt) {
  ModelElement root = make(), child = make(u"c"), grandchild = make(), outsider = make();
  tm.refs(root, tm.children)->add(child);
  tm.refs(child, tm.children)->add(grandchild);
  outsider.setPropertyValue(tm.best, Value::createElementValue(grandchild));
  tm.refs(outsider, tm.friends)->add(child);
  tm.refs(outsider, tm.index)->add(child);
  child.destroy();
  EXPECT_FALSE(child.isLive());
  EXPECT_FALSE(grandchild.isLive());
  EXPECT_TRUE(outsider.getPropertyValue(tm.best).isEmpty());
  EXPECT_EQ(tm.refs(outsider, tm.friends)->size(), 0u);
  EXPECT_EQ(tm.refs(outsider, tm.index)->size(), 0u);
  EXPECT_EQ(tm.refs(root, tm.children)->size(), 0u);
  EXPECT_FALSE(model->findElement(grandchild.getUuid()));
  EXPECT_THROW(child.setPropertyValue(tm.count, Value::of(1)), Exception<msg::CannotModifyDestroyedElement>);
}

TEST_F(Structure, MapsRefuseASecondElementUnderOneKeyAndFollowRenames) {
  ModelElement owner = make(), x = make(u"x"), y = make(u"y"), other = make(u"x");
  auto* index = tm.refs(owner, tm.index);
  index->add(x);
  index->add(y);
  EXPECT_THROW(index->add(other), Exception<msg::UniquenessConstraint>);
  EXPECT_THROW(index->add(x), Exception<msg::CannotAddSecondObject>);
  EXPECT_THROW(tm.setName(y, u"x"), Exception<msg::UniquenessConstraint>);
  EXPECT_EQ(y.getPropertyValue(tm.name).getValue<std::u16string>(), u"y");
  tm.setName(y, u"z");
  EXPECT_EQ(index->genericFind(Value::of(std::u16string(u"z"))).getElement(), y);
  EXPECT_TRUE(index->genericFind(Value::of(std::u16string(u"y"))).isEmpty());
  {
    Transaction t = model->beginTransaction();
    tm.setName(y, u"w");
  }  // the rename rolls back, and so does the key
  EXPECT_EQ(index->genericFind(Value::of(std::u16string(u"z"))).getElement(), y);
}

TEST_F(Structure, CrossModelReferencesAreRefused) {
  Model otherModel = Model::create();
  ModelElement a = make(), stranger = tm.node.instantiate(otherModel);
  EXPECT_THROW(a.setPropertyValue(tm.best, Value::createElementValue(stranger)),
               Exception<msg::CannotCreateCrossModelAssociation>);
  EXPECT_THROW(tm.refs(a, tm.friends)->add(stranger), Exception<msg::CannotCreateCrossModelAssociation>);
}

TEST_F(Structure, ValuesOfTheWrongTypeAreRefused) {
  ModelElement a = make();
  Model metaOnly = Model::create();
  meta::Class unrelated = meta::Class::create(metaOnly, {}, u"Other", u"tm.Other", false);
  unrelated->setSuperclass(ModelElement::metaClass());
  ModelElement foreign = unrelated.instantiate(model);
  EXPECT_THROW(a.setPropertyValue(tm.best, Value::createElementValue(foreign)),
               Exception<msg::CannotAddIncompatibleTypes>);
  EXPECT_THROW(a.setPropertyValue(tm.count, Value::of(std::u16string(u"7"))), Exception<msg::InvalidValue>);
  EXPECT_THROW(tm.values(a, tm.tags)->genericAdd(Value::of(3)), Exception<msg::InvalidValue>);
  EXPECT_THROW(foreign.setPropertyValue(tm.count, Value::of(1)), Exception<msg::NoSuchProperty>);
}

TEST_F(Structure, ReadOnlyAndSetOncePropertiesTakeTheirFirstValueFromBuilders) {
  const Uuid code = generateNewUuid();
  auto builder = tm.node->instantiateBuilder(model);
  builder->setOrAdd(tm.code, Value::of(code));
  ModelElement a = builder->create();
  EXPECT_EQ(a.getPropertyValue(tm.code).getValue<Uuid>(), code);
  EXPECT_THROW(a.setPropertyValue(tm.code, Value::of(generateNewUuid())),
               Exception<msg::CannotSetReadOnlyProperty>);
}

TEST_F(Structure, DefaultsComeFromTheProperty) {
  ModelElement leaf = tm.leaf.instantiate(model);
  EXPECT_EQ(leaf.getPropertyValue(tm.count).getValue<int>(), 7);
  EXPECT_EQ(leaf.getPropertyValue(tm.weight).getValue<int>(), 0);
  EXPECT_EQ(leaf.getPropertyValue(tm.kind).getElement(), tm.kindEnum->findLiteral(u"Plain"));
  EXPECT_FALSE(leaf.hasPropertyValue(tm.born));
  EXPECT_FALSE(leaf.getPropertyValue(tm.born).getValue<boost::optional<DateTime>>());
  EXPECT_EQ(leaf->propertyForSlot(12), tm.weight);
  EXPECT_EQ(leaf->propertyForSlot(1), tm.name);
  // A class is an element too: its own slots belong to its metaclass, not to the class
  // it describes.
  const ModelElement leafClass(tm.leaf);
  EXPECT_EQ(leafClass->propertyForSlot(1), leafClass.getMetaClass()->getPropertyByIndex(1));
  EXPECT_NE(leafClass->propertyForSlot(1), tm.name);
}

TEST_F(Structure, FrozenModelRefusesChangesUnlessThawed) {
  ModelElement a = make();
  Model::Freezer freezer(model);
  EXPECT_THROW(tm.setName(a, u"n"), Exception<msg::CannotModifyFrozenModel>);
  EXPECT_THROW(tm.node.instantiate(model), Exception<msg::CannotModifyFrozenModel>);
  {
    Model::Thawer thawer(model);
    tm.setName(a, u"n");
  }
  EXPECT_THROW(a.destroy(), Exception<msg::CannotModifyFrozenModel>);
  freezer.thaw();
  a.destroy();
  EXPECT_FALSE(a.isLive());
}

TEST_F(Structure, DuplicateUuidsAndAbstractClassesAreRefused) {
  ModelElement a = make();
  EXPECT_THROW(tm.node.instantiate(model, a.getUuid()), Exception<msg::DuplicateElementId>);
  EXPECT_THROW(ModelElement::metaClass().instantiate(model), Exception<msg::CannotInstantiateAbstractClass>);
  EXPECT_EQ(model->getElementCount(), 1u);
}

TEST_F(Structure, ElementsKeepTheirUuidAndOutliveTheirModelAsShells) {
  const Uuid id = generateNewUuid();
  ModelElement a;
  {
    Model scratch = Model::create();
    a = tm.node.instantiate(scratch, id);
    ModelElement b = tm.node.instantiate(scratch);
    tm.refs(a, tm.friends)->add(b);
    EXPECT_EQ(scratch->findElement(id), a);
  }
  EXPECT_EQ(a.getUuid(), id);
  EXPECT_FALSE(a.isLive());
  EXPECT_FALSE(a.getModel());
}

}  // namespace
}  // namespace qf::zero
