// Randomised edits inside nested savepoints: every refused edit changes nothing,
// the model stays consistent after every step, and cancelling restores it exactly.
#include "qf/zero/core/meta/framework_package.h"
#include "support/test_metamodel.h"

#include <boost/date_time/gregorian/gregorian.hpp>

#include <gtest/gtest.h>

#include <random>

namespace qf::zero {
namespace {

using support::dumpModel;

class RandomEditor {
 public:
  RandomEditor(const support::TestMetamodel& tm, Model model, unsigned seed)
      : tm_(tm), model_(std::move(model)), random_(seed) {}

  // One random edit; errors are part of the game, but must leave no trace.
  void step() {
    const std::string before = dumpModel(model_);
    try {
      edit();
    } catch (const foundation::core::except::ExceptionBase&) {
      ASSERT_EQ(before, dumpModel(model_)) << "a refused edit changed the model";
    }
  }

  // Containment, opposites and map keys agree on both ends.
  void checkInvariants() const {
    for (const ModelElement& e : live()) {
      const ModelElement parent = e.getPropertyValue(tm_.parent).getElement();
      ASSERT_EQ(parent, e.container());
      if (parent) {
        ASSERT_TRUE(tm_.refs(parent, tm_.children)->contains(e));
      }
      for (const ModelElement& child : tm_.refs(e, tm_.children)->getAllValues()) {
        ASSERT_EQ(child.container(), e);
        ASSERT_TRUE(child.isLive());
      }
      for (const ModelElement& f : tm_.refs(e, tm_.friends)->getAllValues()) {
        ASSERT_TRUE(f.isLive());
        ASSERT_TRUE(tm_.refs(f, tm_.friends)->contains(e));
      }
      auto* index = tm_.refs(e, tm_.index);
      for (const ModelElement& member : index->getAllValues()) {
        ASSERT_TRUE(member.isLive());
        ASSERT_EQ(index->genericFind(member.getPropertyValue(tm_.name)).getElement(), member);
      }
      const ModelElement best = e.getPropertyValue(tm_.best).getElement();
      if (best) {
        ASSERT_TRUE(best.isLive());
      }
    }
  }

 private:
  std::vector<ModelElement> live() const {
    std::vector<ModelElement> all = model_->getInstances(tm_.node, query::SearchClassMatchMode::IncludeSubclasses);
    return all;
  }
  int pick(int n) { return std::uniform_int_distribution<int>(0, n - 1)(random_); }
  ModelElement any() {
    auto all = live();
    return all.empty() ? ModelElement() : all[static_cast<std::size_t>(pick(static_cast<int>(all.size())))];
  }
  std::u16string someName() { return std::u16string(1, static_cast<char16_t>(u'a' + pick(6))); }

  void edit() {
    ModelElement a = any(), b = any();
    if (!a || pick(8) == 0) {
      ModelElement created = (pick(3) == 0 ? tm_.leaf : tm_.node).instantiate(model_);
      if (a && pick(2) == 0) tm_.refs(a, tm_.children)->add(created);
      return;
    }
    switch (pick(13)) {
      case 0: a.setPropertyValue(tm_.name, Value::of(someName())); break;
      case 1: a.setPropertyValue(tm_.count, Value::of(pick(3))); break;
      case 2: a.setPropertyValue(tm_.kind, Value::createElementValue(tm_.kindEnum->getLiterals()[static_cast<std::size_t>(pick(2))])); break;
      case 3: tm_.values(a, tm_.tags)->genericAdd(Value::of(someName())); break;
      case 4: tm_.values(a, tm_.tags)->genericRemove(Value::of(someName())); break;
      case 5: tm_.refs(a, tm_.children)->insert(static_cast<std::size_t>(pick(3)), b); break;
      case 6: b.setPropertyValue(tm_.parent, pick(4) == 0 ? Value() : Value::createElementValue(a)); break;
      case 7: tm_.refs(a, tm_.friends)->add(b); break;
      case 8: tm_.refs(a, tm_.friends)->remove(b); break;
      case 9: a.setPropertyValue(tm_.best, Value::createElementValue(b)); break;
      case 10: tm_.refs(a, tm_.index)->add(b); break;
      case 11: a.setPropertyValue(tm_.born, Value::of(DateTime(boost::gregorian::date(2020, 1, 1 + pick(5))))); break;
      case 12: if (pick(3) == 0) a.destroy(); break;
    }
  }

  const support::TestMetamodel& tm_;
  Model model_;
  std::mt19937 random_;
};

class RandomRollback : public ::testing::TestWithParam<unsigned> {};

TEST_P(RandomRollback, CancelRestoresTheModelExactly) {
  const unsigned seed = GetParam();
  SCOPED_TRACE("seed " + std::to_string(seed));
  support::TestMetamodel tm;
  Model model = Model::create();
  RandomEditor editor(tm, model, seed);
  for (int i = 0; i < 30; ++i) editor.step();  // a committed starting state
  const std::string start = dumpModel(model);

  Transaction outer = model->beginTransaction();
  for (int round = 0; round < 6; ++round) {
    const std::string atSavepoint = dumpModel(model);
    Transaction inner = model->beginTransaction();
    for (int i = 0; i < 15; ++i) {
      editor.step();
      editor.checkInvariants();
      if (HasFatalFailure()) return;
    }
    if (round % 2 == 0) {
      inner.cancel();
      ASSERT_EQ(atSavepoint, dumpModel(model)) << "inner cancel, round " << round;
      editor.checkInvariants();
    } else {
      inner.commit();
    }
  }
  outer.cancel();
  EXPECT_EQ(start, dumpModel(model));
  editor.checkInvariants();
}

INSTANTIATE_TEST_SUITE_P(Seeds, RandomRollback, ::testing::Range(1u, 41u));

}  // namespace
}  // namespace qf::zero
