// Randomised edits inside nested savepoints: every refused edit changes nothing,
// the model stays consistent after every step, and cancelling restores it exactly, also
// when a destroyed element's UUID was taken by a new element since.
#include "support/random_editor.h"

#include <gtest/gtest.h>

#include <random>

namespace qf::zero {
namespace {

using support::dumpModel;
using support::RandomEditor;

class RandomRollback : public ::testing::TestWithParam<unsigned> {};

TEST_P(RandomRollback, CancelRestoresTheModelExactly) {
  const unsigned seed = GetParam();
  SCOPED_TRACE("seed " + std::to_string(seed));
  support::TestMetamodel tm;
  Model model = Model::create();
  RandomEditor editor(tm, model, seed, /*reuseDestroyedUuids=*/true);
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

INSTANTIATE_TEST_SUITE_P(Seeds, RandomRollback, ::testing::Range(1u, 301u));

}  // namespace
}  // namespace qf::zero
