// Deltas: how presence in the two maps decides an element's state, and how adding,
// setting the previous states and inverting fill the maps.
#include "history_fixture.h"

namespace {

using namespace history_test;

enum class Held { Nothing, Live, Destroyed };
enum class State { Absent, Created, Updated, Deleted };

struct PresenceCase {
  const char* name;
  Held previous;
  Held current;
  State state;
};

const PresenceCase kPresenceCases[] = {
    {"Nothing", Held::Nothing, Held::Nothing, State::Absent},
    {"CurrentOnly", Held::Nothing, Held::Live, State::Created},
    {"Both", Held::Live, Held::Live, State::Updated},
    {"PreviousOnly", Held::Live, Held::Nothing, State::Deleted},
    {"DestroyedCurrent", Held::Nothing, Held::Destroyed, State::Absent},
    {"DestroyedPrevious", Held::Destroyed, Held::Nothing, State::Absent},
    {"LiveCurrentDestroyedPrevious", Held::Destroyed, Held::Live, State::Created},
    {"LivePreviousDestroyedCurrent", Held::Live, Held::Destroyed, State::Deleted},
};

class DeltaPresence : public ::testing::TestWithParam<PresenceCase>, public HistoryModels {};

TEST_P(DeltaPresence, DecidesTheStateOfAnElement) {
  const PresenceCase& row = GetParam();
  const kiv::Delta delta = kiv::Delta::create(repository);
  kiv::ObjectStorage before, after;
  if (row.previous != Held::Nothing) delta.addDeleted(before = stored(a, "before"));
  if (row.current != Held::Nothing) delta->getCurrentMutable().add(after = stored(a, "after"));
  if (row.previous == Held::Destroyed) before.destroy();
  if (row.current == Held::Destroyed) after.destroy();

  EXPECT_EQ(delta.isCreated(a), row.state == State::Created);
  EXPECT_EQ(delta.isUpdated(a), row.state == State::Updated);
  EXPECT_EQ(delta.isDeleted(a), row.state == State::Deleted);
  EXPECT_EQ(delta.getPrevious(a), row.previous == Held::Live ? before : kiv::ObjectStorage());
  EXPECT_EQ(delta.getCurrent(a), row.current == Held::Live ? after : kiv::ObjectStorage());
  if (row.previous != Held::Destroyed && row.current != Held::Destroyed) {
    EXPECT_EQ(delta.isEmpty(), row.state == State::Absent);
  }
}

INSTANTIATE_TEST_SUITE_P(, DeltaPresence, ::testing::ValuesIn(kPresenceCases), CaseName());

using Deltas = HistoryTest;

// A map may hold a proxy for a storage that is not resident. Until it resolves it is no
// storage of the delta; every operation goes on without it.
kiv::ObjectStorage proxyOf(const Model& model, const Uuid& storage) {
  return qf::zero::elementCast<kiv::ObjectStorage>(ModelElement::Impl::createProxy(
      model.getImpl(), kiv::ObjectStorage::metaClass(), qf::zero::ProxyId{storage, u""}));
}

TEST_F(Deltas, AnUnresolvedProxyEntryIsAbsent) {
  const kiv::ObjectStorage a1 = stored(a, "a1");
  const kiv::Delta delta = kiv::Delta::create(repository);
  delta.addCreated(a1);
  delta->getCurrentMutable().addProxy(proxyOf(repository, qf::zero::generateNewUuid()));

  kiv::Delta inverse, composed;
  JsonValue report;
  EXPECT_NO_THROW(inverse = delta.invert());
  EXPECT_NO_THROW(composed = kiv::Delta::compose({delta}));
  EXPECT_NO_THROW(report = delta.toChangeReport());
  if (inverse) {
    EXPECT_EQ(previousOf(inverse), (StorageMap{{a, a1}}));
  }
  if (composed) {
    EXPECT_EQ(currentOf(composed), (StorageMap{{a, a1}}));
  }
  if (!report.is_null()) {
    EXPECT_EQ(report.at("added"), JsonValue::array({a1.getContent()}));
  }
}

TEST_F(Deltas, AProxyEntryIsPresentOnceItsStorageArrives) {
  const Uuid storageId = qf::zero::generateNewUuid();
  const kiv::Delta delta = kiv::Delta::create(repository);
  delta->getCurrentMutable().addProxy(proxyOf(repository, storageId));
  const kiv::ObjectStorage arrived = kiv::ObjectStorage::Builder(repository)
                                         .doSetElementUUID(a)
                                         .doSetContent(JsonValue{{"state", "a1"}})
                                         .create(storageId);

  EXPECT_EQ(delta.getCurrent(a), arrived);
  EXPECT_TRUE(delta.isCreated(a));
  EXPECT_EQ(previousOf(delta.invert()), (StorageMap{{a, arrived}}));
  EXPECT_EQ(delta.toChangeReport().at("added"), JsonValue::array({arrived.getContent()}));
}

// The other add operations are covered by every table that builds deltas.
TEST_F(Deltas, AddUpdatedOfACurrentStateNeedsAPreviousOne) {
  const kiv::Delta delta = kiv::Delta::create(repository);
  kiv::ObjectStorage gone = stored(b, "b0");
  delta.addDeleted(gone);
  gone.destroy();
  const kiv::ObjectStorage c0 = stored(c, "c0");
  delta.addDeleted(c0);
  for (const Uuid& element : {a, b}) {  // a has no previous entry, b's was destroyed
    const kiv::ObjectStorage current = stored(element, "now");
    try {
      delta.addUpdated(current);
      ADD_FAILURE() << "added an update of " << qf::zero::toText(element);
    } catch (const Exception<kiv::messages::NoSuchElement>& e) {
      EXPECT_THAT(e.what(), ::testing::HasSubstr(qf::zero::toText(element)));
    }
    EXPECT_FALSE(delta.getCurrent(element));
  }
  EXPECT_TRUE(currentOf(delta).empty());

  const kiv::ObjectStorage c1 = stored(c, "c1");
  delta.addUpdated(c1);
  EXPECT_TRUE(delta.isUpdated(c));
  EXPECT_EQ(delta.getPrevious(c), c0);
  EXPECT_EQ(currentOf(delta), (StorageMap{{c, c1}}));
}

TEST_F(Deltas, SetPreviousTakesTheOtherDeltasPresentCurrentStates) {
  const kiv::ObjectStorage a0 = stored(a, "a0"), b0 = stored(b, "b0"), b1 = stored(b, "b1");
  const kiv::Delta delta = kiv::Delta::create(repository);
  delta.addDeleted(a0);
  delta.addUpdated(b0, b1);

  const Uuid d = qf::zero::generateNewUuid();
  const kiv::ObjectStorage b2 = stored(b, "b2"), c2 = stored(c, "c2"), z0 = stored(d, "d0");
  kiv::ObjectStorage gone = stored(d, "d2");
  const kiv::Delta other = kiv::Delta::create(repository);
  other.addDeleted(z0);
  other.addCreated(b2);
  other.addCreated(c2);
  delta.addCreated(gone);
  gone.destroy();

  delta.setPrevious(other);
  EXPECT_EQ(previousOf(delta), (StorageMap{{b, b2}, {c, c2}}));
  EXPECT_EQ(currentOf(delta), (StorageMap{{b, b1}}));
  EXPECT_EQ(previousOf(other), (StorageMap{{d, z0}}));
  EXPECT_EQ(currentOf(other), (StorageMap{{b, b2}, {c, c2}}));

  delta.setPrevious(delta);
  EXPECT_EQ(previousOf(delta), (StorageMap{{b, b1}})) << "its own current";
}

TEST_F(Deltas, InvertSwapsTheMapsAndSharesTheStorages) {
  for (const bool snapshot : {false, true}) {
    SCOPED_TRACE(snapshot ? "snapshot" : "not a snapshot");
    const kiv::ObjectStorage a1 = stored(a, "a1"), b0 = stored(b, "b0"), b1 = stored(b, "b1"),
                             c0 = stored(c, "c0");
    const kiv::Delta delta = kiv::Delta::Builder(repository).doSetIsSnapshot(snapshot).create();
    delta.addCreated(a1);
    delta.addUpdated(b0, b1);
    delta.addDeleted(c0);
    const std::size_t elements = repository->getElementCount();

    const kiv::Delta inverse = delta.invert();
    EXPECT_EQ(repository->getElementCount(), elements + 1) << "the storages are shared, not copied";
    EXPECT_NE(inverse.getUuid(), delta.getUuid());
    EXPECT_EQ(inverse.getIsSnapshot(), snapshot);
    EXPECT_EQ(previousOf(inverse), (StorageMap{{a, a1}, {b, b1}}));
    EXPECT_EQ(currentOf(inverse), (StorageMap{{b, b0}, {c, c0}}));
    EXPECT_EQ(previousOf(delta), (StorageMap{{b, b0}, {c, c0}})) << "the delta itself is unchanged";
    EXPECT_EQ(currentOf(delta), (StorageMap{{a, a1}, {b, b1}}));

    const kiv::Delta twice = inverse.invert();
    EXPECT_EQ(previousOf(twice), previousOf(delta));
    EXPECT_EQ(currentOf(twice), currentOf(delta));
    EXPECT_EQ(twice.getIsSnapshot(), snapshot);
    EXPECT_NE(twice.getUuid(), delta.getUuid());
    EXPECT_NE(twice.getUuid(), inverse.getUuid());
    EXPECT_FALSE(twice.isEqual(delta)) << "a delta of its own";
    EXPECT_TRUE(kiv::Delta::create(repository).invert().isEmpty());
  }
}

}  // namespace
