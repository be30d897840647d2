// The reflective (generic) interfaces of collections: positions, replacement,
// and refusals that change nothing.
#include "qf/zero/core/messages.h"
#include "support/test_metamodel.h"

#include <gtest/gtest.h>

namespace qf::zero {
namespace {

using foundation::core::except::Exception;
namespace msg = qf0::messages;

class Collections : public ::testing::Test {
 protected:
  ModelElement make() { return tm.node.instantiate(model); }
  static std::vector<std::u16string> texts(PrimitiveCollection* c) {
    std::vector<std::u16string> out;
    for (const Value& v : c->getAllValues()) out.push_back(v.getValue<std::u16string>());
    return out;
  }
  static Value text(const char16_t* t) { return Value::of(std::u16string(t)); }

  support::TestMetamodel tm;
  Model model = Model::create();
};

TEST_F(Collections, SequencesInsertReplaceAndRemoveByPosition) {
  ModelElement owner = make(), a = make(), b = make(), c = make();
  auto* children = tm.refs(owner, tm.children);
  ASSERT_TRUE(children->isSequenceInterface());
  children->genericAdd(Value::createElementValue(a));
  children->genericInsert(0, Value::createElementValue(b));
  children->genericInsert(1, Value::createElementValue(c));
  EXPECT_EQ(children->getAllValues(), (std::vector<ModelElement>{b, c, a}));
  EXPECT_EQ(children->genericIndexOf(Value::createElementValue(a)), 2u);
  children->genericReplace(0, Value::createElementValue(make()));
  EXPECT_FALSE(b.container());
  EXPECT_TRUE(b.isTopLevel());
  children->genericRemoveAt(1);
  EXPECT_EQ(children->size(), 2u);
  EXPECT_EQ(children->genericAt(1).getElement(), a);
}

TEST_F(Collections, BadPositionsAndItemsAreRefusedWithoutChange) {
  ModelElement owner = make(), a = make(), spare = make(), dead = make();
  dead.destroy();
  auto* children = tm.refs(owner, tm.children);
  children->add(a);
  const std::string before = support::dumpModel(model);
  EXPECT_THROW(children->genericAt(5), Exception<msg::IndexOutOfRange>);
  EXPECT_THROW(children->genericRemoveAt(5), Exception<msg::IndexOutOfRange>);
  EXPECT_THROW(children->genericInsert(5, Value::createElementValue(spare)), Exception<msg::IndexOutOfRange>);
  EXPECT_THROW(children->genericAdd(Value::of(1)), Exception<msg::CannotAddNonExistentObject>);
  EXPECT_THROW(children->genericAdd(Value::createElementValue(a)), Exception<msg::CannotAddSecondObject>);
  EXPECT_THROW(children->genericFind(Value()), Exception<msg::InvalidValue>);
  EXPECT_THROW(children->add(dead), Exception<msg::CannotAddNonExistentObject>);
  EXPECT_FALSE(children->genericRemove(Value::createElementValue(dead)));
  EXPECT_EQ(before, support::dumpModel(model));
}

TEST_F(Collections, PrimitiveSetsKeepEachValueOnce) {
  ModelElement a = make();
  auto* tags = tm.values(a, tm.tags);
  EXPECT_FALSE(tags->isSequenceInterface());
  tags->genericAdd(text(u"x"));
  tags->genericAdd(text(u"y"));
  tags->genericAdd(text(u"x"));
  EXPECT_EQ(texts(tags), (std::vector<std::u16string>{u"x", u"y"}));
  EXPECT_TRUE(tags->genericRemove(text(u"x")));
  EXPECT_FALSE(tags->genericRemove(text(u"x")));
  tags->copyValues({text(u"p"), text(u"q"), text(u"p")});
  EXPECT_EQ(texts(tags), (std::vector<std::u16string>{u"p", u"q"}));
  EXPECT_THROW(tags->copyValues({text(u"ok"), Value::of(1)}), Exception<msg::InvalidValue>);
  EXPECT_EQ(texts(tags), (std::vector<std::u16string>{u"p", u"q"}));
}

TEST_F(Collections, SettingAManyValuedPropertyReplacesItsContentsAtomically) {
  ModelElement a = make(), b = make(), c = make();
  a.setPropertyValue(tm.friends, Value::list({Value::createElementValue(b), Value::createElementValue(c)}));
  EXPECT_TRUE(tm.refs(b, tm.friends)->contains(a));
  const std::string before = support::dumpModel(model);
  EXPECT_THROW(a.setPropertyValue(tm.friends, Value::list({Value::createElementValue(b), Value::of(3)})),
               Exception<msg::CannotAddNonExistentObject>);
  EXPECT_EQ(before, support::dumpModel(model));
  EXPECT_THROW(a.setPropertyValue(tm.friends, Value::of(3)), Exception<msg::InvalidValue>);
  a.setPropertyValue(tm.friends, Value());
  EXPECT_FALSE(a.hasPropertyValue(tm.friends));
  EXPECT_FALSE(tm.refs(c, tm.friends)->contains(a));
}

}  // namespace
}  // namespace qf::zero
