// Delta::toChangeReport: a delta as the framework's change report, and what a destroyed
// element's entry keeps of its stored state.
#include "history_fixture.h"

#include <algorithm>

namespace {

using namespace history_test;

using Deltas = HistoryTest;

TEST_F(Deltas, ChangeReportListsStatesByKindInUuidOrder) {
  EXPECT_EQ(kiv::Delta::create(repository).toChangeReport(), (JsonValue{{"added", JsonValue::array()},
                                                                        {"modified", JsonValue::array()},
                                                                        {"destroyed", JsonValue::array()}}));

  std::vector<Uuid> ids = {a, b, c, qf::zero::generateNewUuid(), qf::zero::generateNewUuid()};
  std::sort(ids.begin(), ids.end());
  const auto entry = [](const char* state) { return JsonValue{{"type", "no.Such"}, {"state", state}}; };
  const auto storage = [&](std::size_t i, const char* state) {
    return kiv::ObjectStorage::Builder(repository)
        .doSetElementUUID(ids[i])
        .doSetContent(entry(state))
        .create();
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
    {"InheritedContainment",
     R"({"type": "tm.Gadget", "id": "$P", "content": {"children": ["$C3", "$C1"], "x": 1}})",
     R"({"type": "tm.Gadget", "id": "$P", "content": {"children": ["$C1"], "x": 1}})"},
    {"UnknownTypeUnchanged", R"({"type": "tm.Nothing", "id": "$P", "content": {"children": ["$C2"]}})",
     R"({"type": "tm.Nothing", "id": "$P", "content": {"children": ["$C2"]}})"},
    {"UnknownTypeWithoutContentUnchanged", R"({"type": "tm.Nothing", "id": "$P"})",
     R"({"type": "tm.Nothing", "id": "$P"})"},
    {"MissingTypeUnchanged", R"({"id": "$P", "content": {"children": ["$C2"]}})",
     R"({"id": "$P", "content": {"children": ["$C2"]}})"},
};

class DeltaDestroyedEntry : public ::testing::TestWithParam<DestroyedEntryCase>, public HistoryModels {
 protected:
  JsonValue document(std::string text) const {
    for (const auto& [name, uuid] : ids) {
      for (std::size_t at; (at = text.find(name)) != std::string::npos;)
        text.replace(at, name.size(), qf::zero::toText(uuid));
    }
    return JsonValue::parse(text);
  }

  // P sorts first, so its entry is reported first.
  const std::map<std::string, Uuid> ids = {
      {"$P", *qf::zero::parseUuid("00000000-0000-4000-8000-000000000001")},
      {"$C1", *qf::zero::parseUuid("00000000-0000-4000-8000-000000000002")},
      {"$C2", *qf::zero::parseUuid("00000000-0000-4000-8000-000000000003")},
      {"$C3", *qf::zero::parseUuid("00000000-0000-4000-8000-000000000004")}};
};

TEST_P(DeltaDestroyedEntry, IsReported) {
  const auto storage = [&](const char* id, const JsonValue& content) {
    return kiv::ObjectStorage::Builder(repository)
        .doSetElementUUID(ids.at(id))
        .doSetContent(content)
        .create();
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

INSTANTIATE_TEST_SUITE_P(, DeltaDestroyedEntry, ::testing::ValuesIn(kDestroyedEntryCases), CaseName());

}  // namespace
