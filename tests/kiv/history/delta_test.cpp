// Deltas: which elements they create, update and delete, how they are built, inverted,
// compared and composed, their change reports, and their transactions.
#include "kiv/messages/messages.h"
#include "kiv/metamodel/delta_impl.h"
#include "kiv/metamodel/object_storage_impl.h"
#include "qf/zero/core/listener.h"
#include "qf/zero/core/messages.h"
#include "qf/zero/core/model_impl.h"
#include "support/test_metamodel.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <nlohmann/json.hpp>

#include <algorithm>
#include <functional>
#include <map>
#include <ostream>
#include <sstream>
#include <string>
#include <unordered_map>
#include <vector>

// Failures show a storage by its state.
namespace kiv {
static void PrintTo(const ObjectStorage& storage, std::ostream* out) {
  if (!storage) {
    *out << "no storage";
  } else if (!storage.isLive()) {
    *out << (storage.isProxy() ? "proxy " : "destroyed storage ") << storage.identifier();
  } else {
    *out << "storage " << storage.getContent().dump();
  }
}
}  // namespace kiv

namespace {

using foundation::core::except::Exception;
using qf::zero::JsonValue;
using qf::zero::Model;
using qf::zero::ModelElement;
using qf::zero::Uuid;
using StorageMap = std::map<Uuid, kiv::ObjectStorage>;

kiv::ObjectStorage storageOf(const Model& model, const Uuid& element, const std::string& state) {
  return kiv::ObjectStorage::Builder(model)
      .doSetElementUUID(element)
      .doSetContent(JsonValue{{"state", state}})
      .create();
}

StorageMap previousOf(const kiv::Delta& delta) { return delta.getPrevious().container(); }
StorageMap currentOf(const kiv::Delta& delta) { return delta.getCurrent().container(); }

class Deltas : public ::testing::Test {
 protected:
  kiv::ObjectStorage stored(const Uuid& element, const std::string& state) {
    return storageOf(repository, element, state);
  }

  Model repository = Model::create();
  const Uuid a = qf::zero::generateNewUuid(), b = qf::zero::generateNewUuid(), c = qf::zero::generateNewUuid();
};

// ---- presence and state of an element --------------------------------------------

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
    {"BothDestroyed", Held::Destroyed, Held::Destroyed, State::Absent},
};

class DeltaPresence : public ::testing::TestWithParam<PresenceCase> {};

TEST_P(DeltaPresence, DecidesTheStateOfAnElement) {
  const PresenceCase& row = GetParam();
  const Model repository = Model::create();
  const Uuid element = qf::zero::generateNewUuid();
  const kiv::Delta delta = kiv::Delta::create(repository);
  kiv::ObjectStorage before, after;
  if (row.previous != Held::Nothing) delta.addDeleted(before = storageOf(repository, element, "before"));
  if (row.current != Held::Nothing) delta->getCurrentMutable().add(after = storageOf(repository, element, "after"));
  if (row.previous == Held::Destroyed) before.destroy();
  if (row.current == Held::Destroyed) after.destroy();

  EXPECT_EQ(delta.isCreated(element), row.state == State::Created);
  EXPECT_EQ(delta.isUpdated(element), row.state == State::Updated);
  EXPECT_EQ(delta.isDeleted(element), row.state == State::Deleted);
  EXPECT_EQ(delta.getPrevious(element), row.previous == Held::Live ? before : kiv::ObjectStorage());
  EXPECT_EQ(delta.getCurrent(element), row.current == Held::Live ? after : kiv::ObjectStorage());
  if (row.previous != Held::Destroyed && row.current != Held::Destroyed) {
    EXPECT_EQ(delta.isEmpty(), row.state == State::Absent);
  }
}

INSTANTIATE_TEST_SUITE_P(, DeltaPresence, ::testing::ValuesIn(kPresenceCases),
                         [](const ::testing::TestParamInfo<PresenceCase>& info) {
                           return std::string(info.param.name);
                         });

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

// ---- building ------------------------------------------------------------------------

TEST_F(Deltas, AddOperationsFillTheMapsTheirStatesName) {
  const kiv::Delta delta = kiv::Delta::create(repository);
  EXPECT_TRUE(delta.isEmpty());
  const kiv::ObjectStorage c0 = stored(c, "c0");
  delta.addDeleted(c0);
  EXPECT_FALSE(delta.isEmpty()) << "a previous entry alone";
  EXPECT_TRUE(delta.isDeleted(c));

  const kiv::ObjectStorage a1 = stored(a, "a1");
  delta.addCreated(a1);
  EXPECT_TRUE(delta.isCreated(a));

  const kiv::ObjectStorage b0 = stored(b, "b0"), b1 = stored(b, "b1");
  delta.addUpdated(b0, b1);
  EXPECT_TRUE(delta.isUpdated(b));

  const kiv::ObjectStorage c1 = stored(c, "c1");
  delta.addUpdated(c1);
  EXPECT_TRUE(delta.isUpdated(c)) << "the current state joins the recorded previous one";

  EXPECT_EQ(previousOf(delta), (StorageMap{{b, b0}, {c, c0}}));
  EXPECT_EQ(currentOf(delta), (StorageMap{{a, a1}, {b, b1}, {c, c1}}));
}

TEST_F(Deltas, AddUpdatedOfACurrentStateNamesTheElementWithoutAPreviousOne) {
  const kiv::Delta delta = kiv::Delta::create(repository);
  kiv::ObjectStorage gone = stored(b, "b0");
  delta.addDeleted(gone);
  gone.destroy();
  delta.addDeleted(stored(c, "c0"));
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

// ---- inverting -------------------------------------------------------------------------

TEST_F(Deltas, InvertSwapsTheMapsAndSharesTheStorages) {
  for (const bool snapshot : {false, true}) {
    SCOPED_TRACE(snapshot ? "snapshot" : "not a snapshot");
    const kiv::ObjectStorage a1 = stored(a, "a1"), b0 = stored(b, "b0"), b1 = stored(b, "b1"), c0 = stored(c, "c0");
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

// ---- equality --------------------------------------------------------------------------

// `mine` creates a, updates b and deletes c and is a snapshot; each row builds the delta
// it is compared with.
struct DeltaWorld {
  Model repository = Model::create();
  Model elsewhere = Model::create();
  Uuid a = qf::zero::generateNewUuid(), b = qf::zero::generateNewUuid(), c = qf::zero::generateNewUuid();
  kiv::Delta mine;

  DeltaWorld() {
    mine = kiv::Delta::Builder(repository).doSetIsSnapshot(true).create();
    mine.addCreated(storageOf(repository, a, "a1"));
    mine.addUpdated(storageOf(repository, b, "b0"), storageOf(repository, b, "b1"));
    mine.addDeleted(storageOf(repository, c, "c0"));
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
    {"EntryMissing", false,
     [](DeltaWorld& w) {
       const kiv::Delta copy = w.copy();
       copy->getCurrentMutable().remove(copy.getCurrent(w.a));
       return copy;
     }},
    {"ExtraEntry", false,
     [](DeltaWorld& w) {
       const kiv::Delta copy = w.copy();
       copy.addCreated(storageOf(w.elsewhere, qf::zero::generateNewUuid(), "x"));
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

INSTANTIATE_TEST_SUITE_P(, DeltaEquality, ::testing::ValuesIn(kDeltaEqualityCases),
                         [](const ::testing::TestParamInfo<DeltaEqualityCase>& info) {
                           return std::string(info.param.name);
                         });

// ---- composing -------------------------------------------------------------------------

// A delta is written as words: "+a1" creates element a with storage a1, "a0>a1" updates
// a from a0 to a1, "-a0" deletes a with a0, "!" makes it a snapshot. A label names one
// storage throughout a row; "~a0" is storage a0 destroyed once every delta is built.
// "null" is a null delta, "invert N" the inverse of the delta at position N and "as N"
// that very delta again. Sequences are written latest first, as compose takes them.
struct ComposeCase {
  const char* name;
  std::vector<std::string> latestFirst;
  std::string expected;
};

const ComposeCase kComposeCases[] = {
    {"OneDelta", {"+a1 b0>b1 -c0 !"}, "+a1 b0>b1 -c0 !"},
    {"CreatedThenUpdated", {"a1>a2", "+a1"}, "+a2"},
    {"CreatedThenDeleted", {"-a1", "+a1"}, ""},
    {"UpdatedThenInverted", {"invert 1", "a0>a1"}, ""},
    {"InvertedThenReapplied", {"a0>a1", "invert 0"}, ""},
    {"UpdatedUndoneAndRedone", {"a0>a1", "invert 0", "as 0"}, "a0>a1"},
    {"UpdatedTwice", {"a1>a2", "a0>a1"}, "a0>a2"},
    {"UpdatedThenDeleted", {"-a1", "a0>a1"}, "-a0"},
    {"DeletedThenCreatedAnew", {"+a1", "-a0"}, "a0>a1"},
    {"CreatedUpdatedDeleted", {"-a2", "a1>a2", "+a1"}, ""},
    {"DeletedCreatedDeleted", {"-a1", "+a1", "-a0"}, "-a0"},
    {"IndependentElements", {"+b1 c1>c2", "+a1 c0>c1 -d0"}, "+a1 +b1 c0>c2 -d0"},
    {"SnapshotInTheOldest", {"a1>a2", "a0>a1 !"}, "a0>a2 !"},
    {"SnapshotInTheLatest", {"!", "+a1"}, "+a1 !"},
    {"NoSnapshot", {"", ""}, ""},
    {"DestroyedStoragesIgnored", {"-~b0 +c1", "~a0>a1 +~d1"}, "+a1 +c1"},
    {"DestroyedDeletionDeletesNothing", {"-~a9", "+a1"}, "+a1"},
    {"NullDeltasCountAsEmpty", {"a1>a2", "null", "a0>a1"}, "a0>a2"},
    {"NullFirst", {"null", "+a1 !"}, "+a1 !"},
};

class DeltaCompose : public ::testing::TestWithParam<ComposeCase> {
 protected:
  std::vector<std::string> words(const std::string& text) {
    std::istringstream in(text);
    std::vector<std::string> result;
    for (std::string word; in >> word;) result.push_back(word);
    return result;
  }

  Uuid element(char name) {
    const auto [it, added] = elements_.try_emplace(name, Uuid());
    if (added) it->second = qf::zero::generateNewUuid();
    return it->second;
  }

  kiv::ObjectStorage storage(std::string label) {
    const bool destroyed = label.front() == '~';
    if (destroyed) label.erase(0, 1);
    auto it = storages_.find(label);
    if (it == storages_.end()) {
      it = storages_.emplace(label, storageOf(repository, element(label.front()), label)).first;
      labels_[it->second] = label;
    }
    if (destroyed) doomed_.push_back(it->second);
    return it->second;
  }

  kiv::Delta build(const std::string& text) {
    if (text == "null") return {};
    const kiv::Delta delta = kiv::Delta::create(repository);
    for (const std::string& word : words(text)) {
      if (word == "!") {
        delta->setIsSnapshot(true);
      } else if (word.front() == '+') {
        delta.addCreated(storage(word.substr(1)));
      } else if (word.front() == '-') {
        delta.addDeleted(storage(word.substr(1)));
      } else {
        const auto arrow = word.find('>');
        delta.addUpdated(storage(word.substr(0, arrow)), storage(word.substr(arrow + 1)));
      }
    }
    return delta;
  }

  // The deltas of a row, with every "~" storage destroyed.
  std::vector<kiv::Delta> sequence(const std::vector<std::string>& latestFirst) {
    std::vector<kiv::Delta> deltas;
    for (const std::string& text : latestFirst) {
      const bool refers = text.rfind("invert ", 0) == 0 || text.rfind("as ", 0) == 0;
      deltas.push_back(refers ? kiv::Delta() : build(text));
    }
    for (std::size_t i = 0; i < latestFirst.size(); ++i) {
      const std::vector<std::string> w = words(latestFirst[i]);
      if (w.size() == 2 && (w[0] == "invert" || w[0] == "as")) {
        const kiv::Delta& target = deltas.at(std::stoul(w[1]));
        deltas[i] = w[0] == "invert" ? target.invert() : target;
      }
    }
    for (kiv::ObjectStorage& s : doomed_) s.destroy();
    return deltas;
  }

  // A delta in the words above, elements in name order.
  std::string describe(const kiv::Delta& delta) {
    std::vector<std::string> described;
    for (const auto& [name, uuid] : elements_) {
      const kiv::ObjectStorage before = delta.getPrevious(uuid), after = delta.getCurrent(uuid);
      if (before && after) described.push_back(labelOf(before) + ">" + labelOf(after));
      if (!before && after) described.push_back("+" + labelOf(after));
      if (before && !after) described.push_back("-" + labelOf(before));
    }
    if (delta.getIsSnapshot()) described.push_back("!");
    std::string text;
    for (const std::string& word : described) text += (text.empty() ? "" : " ") + word;
    const std::size_t entries = delta.getPrevious().container().size() + delta.getCurrent().container().size();
    std::size_t present = 0;
    for (const auto& [name, uuid] : elements_)
      present += (delta.getPrevious(uuid) ? 1 : 0) + (delta.getCurrent(uuid) ? 1 : 0);
    if (entries != present) text += " (and " + std::to_string(entries - present) + " other entries)";
    return text;
  }

  std::string labelOf(const kiv::ObjectStorage& s) {
    const auto it = labels_.find(s);
    return it == labels_.end() ? "?" : it->second;
  }

  Model repository = Model::create();

 private:
  std::map<char, Uuid> elements_;
  std::map<std::string, kiv::ObjectStorage> storages_;
  std::unordered_map<kiv::ObjectStorage, std::string> labels_;
  std::vector<kiv::ObjectStorage> doomed_;
};

TEST_P(DeltaCompose, Gives) {
  const std::vector<kiv::Delta> deltas = sequence(GetParam().latestFirst);
  std::vector<std::string> inputs;
  for (const kiv::Delta& delta : deltas) inputs.push_back(delta ? describe(delta) : "null");

  const kiv::Delta composed = kiv::Delta::compose(deltas);
  ASSERT_TRUE(composed);
  EXPECT_EQ(describe(composed), GetParam().expected);
  EXPECT_EQ(composed.getModel(), repository);
  for (std::size_t i = 0; i < deltas.size(); ++i) {
    if (!deltas[i]) continue;
    EXPECT_NE(composed.getUuid(), deltas[i].getUuid()) << "a delta of its own";
    EXPECT_EQ(describe(deltas[i]), inputs[i]) << "delta " << i << " is left as it was";
  }
}

INSTANTIATE_TEST_SUITE_P(, DeltaCompose, ::testing::ValuesIn(kComposeCases),
                         [](const ::testing::TestParamInfo<ComposeCase>& info) {
                           return std::string(info.param.name);
                         });

// ---- change reports ----------------------------------------------------------------------

TEST_F(Deltas, ChangeReportListsStatesByKindInUuidOrder) {
  EXPECT_EQ(
      kiv::Delta::create(repository).toChangeReport(),
      (JsonValue{{"added", JsonValue::array()}, {"modified", JsonValue::array()}, {"destroyed", JsonValue::array()}}));

  std::vector<Uuid> ids = {a, b, c, qf::zero::generateNewUuid(), qf::zero::generateNewUuid()};
  std::sort(ids.begin(), ids.end());
  const auto entry = [](const char* state) { return JsonValue{{"type", "no.Such"}, {"state", state}}; };
  const auto storage = [&](std::size_t i, const char* state) {
    return kiv::ObjectStorage::Builder(repository).doSetElementUUID(ids[i]).doSetContent(entry(state)).create();
  };
  const kiv::Delta delta = kiv::Delta::create(repository);
  delta.addDeleted(storage(4, "gone"));
  delta.addCreated(storage(3, "new 3"));
  delta.addUpdated(storage(2, "old"), storage(2, "modified"));
  delta.addDeleted(storage(1, "gone too"));
  delta.addCreated(storage(0, "new 0"));

  const JsonValue report = delta.toChangeReport();
  EXPECT_EQ(report, (JsonValue{{"added", JsonValue::array({entry("new 0"), entry("new 3")})},
                               {"modified", JsonValue::array({entry("modified")})},
                               {"destroyed", JsonValue::array({entry("gone too"), entry("gone")})}}));
}

// A deleted element P is reported with its stored entry. Its children C1 (deleted too),
// C2 (updated, so alive) and C3 (not in the delta) are named by "$C1" and so on.
struct DestroyedEntryCase {
  const char* name;
  const char* stored;
  const char* reported;
};

const DestroyedEntryCase kDestroyedEntryCases[] = {
    {"KnownTypeWithoutContentGetsAnEmptyOne", R"({"type": "tm.Node", "id": "$P"})",
     R"({"type": "tm.Node", "id": "$P", "content": {}})"},
    {"SurvivingChildrenLeaveTheContainment",
     R"({"type": "tm.Node", "id": "$P", "content": {"name": "p", "children": ["$C1", "$C2", "$C3"],
         "friends": ["$C2"], "best": "$C3", "tags": ["$C2"], "count": 7}})",
     R"({"type": "tm.Node", "id": "$P", "content": {"name": "p", "children": ["$C1"],
         "friends": ["$C2"], "best": "$C3", "tags": ["$C2"], "count": 7}})"},
    {"InheritedContainment", R"({"type": "tm.Gadget", "id": "$P", "content": {"children": ["$C3", "$C1"], "x": 1}})",
     R"({"type": "tm.Gadget", "id": "$P", "content": {"children": ["$C1"], "x": 1}})"},
    {"UnknownTypeUnchanged", R"({"type": "tm.Nothing", "id": "$P", "content": {"children": ["$C2"]}})",
     R"({"type": "tm.Nothing", "id": "$P", "content": {"children": ["$C2"]}})"},
    {"UnknownTypeWithoutContentUnchanged", R"({"type": "tm.Nothing", "id": "$P"})",
     R"({"type": "tm.Nothing", "id": "$P"})"},
    {"MissingTypeUnchanged", R"({"id": "$P", "content": {"children": ["$C2"]}})",
     R"({"id": "$P", "content": {"children": ["$C2"]}})"},
};

class DeltaDestroyedEntry : public ::testing::TestWithParam<DestroyedEntryCase> {
 protected:
  JsonValue document(std::string text) const {
    for (const auto& [name, uuid] : ids) {
      for (std::size_t at; (at = text.find(name)) != std::string::npos;)
        text.replace(at, name.size(), qf::zero::toText(uuid));
    }
    return JsonValue::parse(text);
  }

  support::TestMetamodel tm;
  Model repository = Model::create();
  // P sorts first, so its entry is reported first.
  const std::map<std::string, Uuid> ids = {{"$P", *qf::zero::parseUuid("00000000-0000-4000-8000-000000000001")},
                                           {"$C1", *qf::zero::parseUuid("00000000-0000-4000-8000-000000000002")},
                                           {"$C2", *qf::zero::parseUuid("00000000-0000-4000-8000-000000000003")},
                                           {"$C3", *qf::zero::parseUuid("00000000-0000-4000-8000-000000000004")}};
};

TEST_P(DeltaDestroyedEntry, IsReported) {
  const auto storage = [&](const char* id, const JsonValue& content) {
    return kiv::ObjectStorage::Builder(repository).doSetElementUUID(ids.at(id)).doSetContent(content).create();
  };
  const JsonValue child = document(R"({"type": "tm.Node", "id": "$C1", "content": {}})");
  const kiv::Delta delta = kiv::Delta::create(repository);
  const kiv::ObjectStorage parent = storage("$P", document(GetParam().stored));
  delta.addDeleted(parent);
  delta.addDeleted(storage("$C1", child));
  delta.addUpdated(storage("$C2", JsonValue::object()), storage("$C2", JsonValue::object()));

  const JsonValue report = delta.toChangeReport();
  EXPECT_EQ(report.at("destroyed"), JsonValue::array({document(GetParam().reported), child}));
  EXPECT_EQ(parent.getContent(), document(GetParam().stored)) << "the stored entry is left alone";
}

INSTANTIATE_TEST_SUITE_P(, DeltaDestroyedEntry, ::testing::ValuesIn(kDestroyedEntryCases),
                         [](const ::testing::TestParamInfo<DestroyedEntryCase>& info) {
                           return std::string(info.param.name);
                         });

// ---- failures ----------------------------------------------------------------------------

// Every row fails inside a transaction the caller holds open: the repository (and the
// other model) must be left exactly as they were, and the caller's transaction usable.
struct Scene {
  Model repository = Model::create();
  Model elsewhere = Model::create();
  Uuid a = qf::zero::generateNewUuid(), b = qf::zero::generateNewUuid(), c = qf::zero::generateNewUuid();
  Uuid fresh = qf::zero::generateNewUuid();
  // `delta` creates a, deletes b and updates c.
  kiv::Delta delta = kiv::Delta::create(repository);
  kiv::ObjectStorage a2 = storageOf(repository, a, "a2"), b2 = storageOf(repository, b, "b2");
  kiv::ObjectStorage c2 = storageOf(repository, c, "c2"), fresh0 = storageOf(repository, fresh, "fresh0");
  kiv::ObjectStorage foreign = storageOf(elsewhere, fresh, "foreign");
  kiv::Delta foreignDelta = kiv::Delta::create(elsewhere);

  Scene() {
    delta.addCreated(storageOf(repository, a, "a1"));
    delta.addDeleted(storageOf(repository, b, "b0"));
    delta.addUpdated(storageOf(repository, c, "c0"), storageOf(repository, c, "c1"));
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
    {"AddUpdatedWhoseCurrentKeyIsTaken", "UniquenessConstraint", [](Scene& s) { s.delta.addUpdated(s.fresh0, s.a2); }},
    {"AddUpdatedOfATakenCurrent", "UniquenessConstraint", [](Scene& s) { s.delta.addUpdated(s.c2); }},
    {"AddUpdatedWithoutPrevious", "NoSuchElement", [](Scene& s) { s.delta.addUpdated(s.fresh0); }},
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
    {"SetContentOfNoElement", "ElementRequired", [](Scene& s) { s.a2.setContent(ModelElement()); }},
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

INSTANTIATE_TEST_SUITE_P(, DeltaFailure, ::testing::ValuesIn(kFailureCases),
                         [](const ::testing::TestParamInfo<FailureCase>& info) {
                           return std::string(info.param.name);
                         });

}  // namespace
