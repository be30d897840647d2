// The reflective (generic) interfaces of collections: positions, replacement,
// and refusals that change nothing.
#include "qf/zero/core/messages.h"
#include "support/test_metamodel.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <random>
#include <string>
#include <vector>

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

// addAll is add() of each element in turn, in one step. On seeded random batches for a map
// (names rising past the last key or not, repeated names, elements held already, destroyed
// elements, null handles, elements of another class) and for a sequence, it leaves what
// adding the same elements one by one in a transaction leaves, raises the same message when
// that raises, then adds nothing, and a cancelled transaction takes all of it back.
class AddAll : public Collections, public ::testing::WithParamInterface<unsigned> {
 protected:
  static bool isHeldBy(const ModelElement& element, const ModelElement& holder, const meta::Property& via) {
    const auto& incoming = element->incomingReferences();
    return std::any_of(incoming.begin(), incoming.end(),
                       [&](const ModelElement::Impl::IncomingReference& entry) {
                         return entry.source == holder.getImpl() && entry.property == via.getImpl();
                       });
  }
  // The contents of a collection in an order that does not depend on how a set hashes.
  std::vector<ModelElement> contents(const ModelElement& owner, const meta::Property& property) {
    std::vector<ModelElement> items = tm.refs(owner, property)->getAllValuesAndProxies();
    if (!property->isMap()) {
      std::sort(items.begin(), items.end(),
                [](const ModelElement& a, const ModelElement& b) { return a.getUuid() < b.getUuid(); });
    }
    return items;
  }
};

TEST_P(AddAll, IsAddingEachInTurnInOneStep) {
  std::mt19937 random(GetParam());
  const auto pick = [&](int n) { return std::uniform_int_distribution<int>(0, n - 1)(random); };
  const auto named = [&](int number) {
    ModelElement node = make();
    tm.setName(node, u"n" + std::u16string(1, static_cast<char16_t>(u'a' + number / 26)) +
                         std::u16string(1, static_cast<char16_t>(u'a' + number % 26)));
    return node;
  };
  std::vector<ModelElement> pool;
  for (int i = 0; i < 60; ++i) pool.push_back(named(i));
  ModelElement dead = named(70), leaf = tm.leaf.instantiate(model);
  dead.destroy();
  const ModelElement one = make(), other = make();
  for (const meta::Property& property : {tm.index, tm.friends}) {
    for (int round = 0; round < 25; ++round) {
      std::vector<ModelElement> batch;
      int next = pick(20);
      for (int i = pick(8); i > 0; --i) {
        switch (pick(14)) {
          case 0:
            batch.push_back(ModelElement());
            break;
          case 1:
            batch.push_back(dead);
            break;
          case 2:
            batch.push_back(leaf);
            break;
          case 3:
            batch.push_back(pool[pick(60)]);
            break;
          case 4:
            batch.push_back(named(pick(60)));
            break;  // a name that may be taken
          default:
            next += 1 + pick(3);
            batch.push_back(pool[next % 60]);
            break;
        }
      }
      std::string expectedError, actualError;
      {
        Transaction transaction = model->beginTransaction();
        try {
          for (const ModelElement& element : batch) tm.refs(one, property)->add(element);
          transaction.commit();
        } catch (const foundation::core::except::ExceptionBase& error) {
          expectedError = error.GetID();
        }
      }
      const std::vector<ModelElement> before = contents(other, property);
      try {
        tm.refs(other, property)->addAll(batch);
      } catch (const foundation::core::except::ExceptionBase& error) {
        actualError = error.GetID();
      }
      ASSERT_EQ(actualError, expectedError) << "round " << round;
      if (!actualError.empty()) {
        EXPECT_EQ(contents(other, property), before) << "a refused batch adds none";
      }
      ASSERT_EQ(contents(other, property), contents(one, property)) << "round " << round;
      for (const ModelElement& element : tm.refs(other, property)->getAllValuesAndProxies()) {
        EXPECT_TRUE(isHeldBy(element, other, property)) << "the incoming index knows the holder";
      }
    }
    const std::vector<ModelElement> before = contents(other, property);
    std::vector<ModelElement> fresh;
    {
      Transaction cancelled = model->beginTransaction();
      for (int i = 0; i < 5; ++i) fresh.push_back(named(80 + i));
      tm.refs(other, property)->addAll(fresh);
    }
    EXPECT_EQ(contents(other, property), before) << "a cancel takes a batch back";
  }
}

INSTANTIATE_TEST_SUITE_P(Seeds, AddAll, ::testing::Range(1U, 9U));

}  // namespace
}  // namespace qf::zero
