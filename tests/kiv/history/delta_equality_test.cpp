// Delta equality: the same recorded delta, that is equal storages and the same own UUID.
#include "history_fixture.h"

namespace {

using namespace history_test;

// `mine` creates a, updates b and deletes c and is a snapshot; each row builds the delta
// it is compared with.
struct DeltaWorld : HistoryModels {
  kiv::Delta mine;

  DeltaWorld() {
    mine = kiv::Delta::Builder(repository).doSetIsSnapshot(true).create();
    mine.addCreated(stored(a, "a1"));
    mine.addUpdated(stored(b, "b0"), stored(b, "b1"));
    mine.addDeleted(stored(c, "c0"));
  }

  // The same delta in another model: same own UUIDs throughout unless told otherwise.
  kiv::Delta copy(bool sameStorageUuids = true) const {
    const auto copied = [&](const kiv::ObjectStorage& s) {
      return kiv::ObjectStorage::Builder(elsewhere)
          .doSetElementUUID(s.getElementUUID())
          .doSetContent(s.getContent())
          .create(sameStorageUuids ? s.getUuid() : Uuid());
    };
    kiv::Delta::Builder builder(elsewhere);
    builder.doSetIsSnapshot(mine.getIsSnapshot());
    for (const auto& [uuid, s] : mine.getPrevious().container()) builder.doAddPrevious(copied(s));
    for (const auto& [uuid, s] : mine.getCurrent().container()) builder.doAddCurrent(copied(s));
    return builder.create(mine.getUuid());
  }
};

struct DeltaEqualityCase {
  const char* name;
  bool expected;
  kiv::Delta (*other)(DeltaWorld& world);
};

const DeltaEqualityCase kDeltaEqualityCases[] = {
    {"Itself", true, [](DeltaWorld& w) { return w.mine; }},
    {"NoDelta", false, [](DeltaWorld&) { return kiv::Delta(); }},
    {"CopyElsewhere", true, [](DeltaWorld& w) { return w.copy(); }},
    {"DestroyedCopy", false,
     [](DeltaWorld& w) {
       kiv::Delta copy = w.copy();
       copy.destroy();
       return copy;
     }},
    {"SnapshotFlagDiffers", false,
     [](DeltaWorld& w) {
       const kiv::Delta copy = w.copy();
       copy->setIsSnapshot(false);
       return copy;
     }},
    {"OneStateDiffers", false,
     [](DeltaWorld& w) {
       const kiv::Delta copy = w.copy();
       copy.getPrevious(w.b)->setContent(JsonValue{{"state", "b9"}});
       return copy;
     }},
    {"StoragesWithOtherOwnUuids", false, [](DeltaWorld& w) { return w.copy(/*sameStorageUuids=*/false); }},
    // Compared both ways, so this also stands for an entry too many.
    {"EntryMissing", false,
     [](DeltaWorld& w) {
       const kiv::Delta copy = w.copy();
       copy->getCurrentMutable().remove(copy.getCurrent(w.a));
       return copy;
     }},
    {"DestroyedStorageInCopy", false,
     [](DeltaWorld& w) {
       const kiv::Delta copy = w.copy();
       copy.getCurrent(w.a).destroy();
       return copy;
     }},
    {"DoubleInverse", false, [](DeltaWorld& w) { return w.mine.invert().invert(); }},
};

class DeltaEquality : public ::testing::TestWithParam<DeltaEqualityCase> {};

TEST_P(DeltaEquality, Compares) {
  DeltaWorld world;
  const kiv::Delta other = GetParam().other(world);
  EXPECT_EQ(world.mine.isEqual(other), GetParam().expected);
  if (other && other.isLive()) {
    EXPECT_EQ(other.isEqual(world.mine), GetParam().expected) << "symmetric";
  }
}

INSTANTIATE_TEST_SUITE_P(, DeltaEquality, ::testing::ValuesIn(kDeltaEqualityCases), CaseName());

}  // namespace
