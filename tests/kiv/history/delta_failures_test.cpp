// Delta operations that raise: each leaves the models as they were and the caller's
// transaction usable.
#include "history_fixture.h"

namespace {

using namespace history_test;

// Every row fails inside a transaction the caller holds open: the repository (and the
// other model) must be left exactly as they were, and the caller's transaction usable.
struct Scene : HistoryModels {
  const Uuid fresh = qf::zero::generateNewUuid();
  // `delta` creates a, deletes b and updates c.
  kiv::Delta delta = kiv::Delta::create(repository);
  kiv::ObjectStorage a2 = stored(a, "a2"), b2 = stored(b, "b2"), c2 = stored(c, "c2"),
                     fresh0 = stored(fresh, "fresh0");
  kiv::ObjectStorage foreign = storageOf(elsewhere, fresh, "foreign");
  kiv::Delta foreignDelta = kiv::Delta::create(elsewhere);

  Scene() {
    delta.addCreated(stored(a, "a1"));
    delta.addDeleted(stored(b, "b0"));
    delta.addUpdated(stored(c, "c0"), stored(c, "c1"));
    foreignDelta.addCreated(foreign);
  }
};

struct FailureCase {
  const char* name;
  const char* message;
  void (*operation)(Scene& scene);
};

const FailureCase kFailureCases[] = {
    {"AddCreatedUnderATakenKey", "UniquenessConstraint", [](Scene& s) { s.delta.addCreated(s.a2); }},
    {"AddDeletedUnderATakenKey", "UniquenessConstraint", [](Scene& s) { s.delta.addDeleted(s.b2); }},
    // The previous entry is added before the current one fails: it must go again.
    {"AddUpdatedWhoseCurrentKeyIsTaken", "UniquenessConstraint",
     [](Scene& s) { s.delta.addUpdated(s.fresh0, s.a2); }},
    {"AddUpdatedOfATakenCurrent", "UniquenessConstraint", [](Scene& s) { s.delta.addUpdated(s.c2); }},
    {"AddCreatedFromAnotherModel", "CannotCreateCrossModelAssociation",
     [](Scene& s) { s.delta.addCreated(s.foreign); }},
    {"SetPreviousOfNoDelta", "ElementRequired", [](Scene& s) { s.delta.setPrevious(kiv::Delta()); }},
    {"SetPreviousFromAnotherModel", "CannotCreateCrossModelAssociation",
     [](Scene& s) { s.delta.setPrevious(s.foreignDelta); }},
    {"ComposeNothing", "CannotComposeZeroDeltas", [](Scene&) { kiv::Delta::compose({}); }},
    {"ComposeOnlyNullDeltas", "ElementRequired",
     [](Scene&) {
       kiv::Delta::compose({kiv::Delta(), kiv::Delta()});
     }},
    {"ComposeAcrossModels", "CannotCreateCrossModelAssociation",
     [](Scene& s) {
       kiv::Delta::compose({s.delta, s.foreignDelta});
     }},
};

class DeltaFailure : public ::testing::TestWithParam<FailureCase> {};

TEST_P(DeltaFailure, ChangesNothing) {
  Scene scene;
  const std::string repositoryBefore = support::dumpModel(scene.repository);
  const std::string elsewhereBefore = support::dumpModel(scene.elsewhere);
  const std::size_t elements = scene.repository->getElementCount();
  const std::size_t elementsElsewhere = scene.elsewhere->getElementCount();
  {
    qf::zero::Transaction caller = scene.repository->beginTransaction();
    try {
      GetParam().operation(scene);
      ADD_FAILURE() << "no exception";
    } catch (const foundation::core::except::ExceptionBase& e) {
      EXPECT_THAT(e.GetID(), ::testing::EndsWith("/" + std::string(GetParam().message)));
    }
    EXPECT_EQ(scene.repository->getElementCount(), elements);
    EXPECT_EQ(scene.elsewhere->getElementCount(), elementsElsewhere);
    EXPECT_EQ(support::dumpModel(scene.repository), repositoryBefore);
    EXPECT_EQ(support::dumpModel(scene.elsewhere), elsewhereBefore);

    scene.delta.addCreated(scene.fresh0);
    EXPECT_NO_THROW(caller.commit());
  }
  EXPECT_EQ(scene.delta.getCurrent(scene.fresh), scene.fresh0) << "the caller's transaction went on";
}

INSTANTIATE_TEST_SUITE_P(, DeltaFailure, ::testing::ValuesIn(kFailureCases), CaseName());

}  // namespace
