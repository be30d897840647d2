// The branch map of a repository: adding and removing branches, synchronising one
// repository's branches with another's, the check a pushed history must pass, and the
// texts a repository writes.
#include "kiv/metamodel/protocol/history_impl.h"
#include "kiv/repository/repository_fixture.h"
#include "kiv/repository/repository_listener.h"
#include "qf/zero/core/messages.h"
#include "qf/zero/core/text.h"

#include <algorithm>
#include <functional>
#include <random>
#include <set>

namespace repository_test {
namespace {

using repository_test::PrintTo;

using Names = std::vector<std::u16string>;

class RepositoryCore : public ::testing::Test, public RepositoryModels {};

// One step on a repository's branch map; `fails` names the error it must raise.
struct MapStep {
  enum Kind { Add, Remove } kind;
  std::u16string name;
  bool fails = false;
};

struct BranchMapCase {
  std::string name;
  std::vector<MapStep> steps;
  Names after;
};

class BranchMap : public ::testing::TestWithParam<BranchMapCase>, public RepositoryModels {};

TEST_P(BranchMap, AddsAndRemovesByName) {
  const BranchMapCase& row = GetParam();
  const kiv::LocalRepository repository = makeRepository({});
  EXPECT_TRUE(repository->isEmpty());
  for (const MapStep& step : row.steps) {
    SCOPED_TRACE(qf::zero::toUtf8(step.name));
    const kiv::Branch branch = step.kind == MapStep::Add ? makeBranch({step.name, "c1"}) : kiv::Branch();
    const std::string before = dumpOf(repositories);
    if (step.kind == MapStep::Add && step.fails) {
      EXPECT_TRUE(raises([&] { repository->add(branch); }, kiv::messages::BranchExists(step.name)));
    } else if (step.kind == MapStep::Add) {
      repository->add(branch);
      EXPECT_EQ(repository->getBranches().container().at(step.name), branch);
    } else if (step.fails) {
      EXPECT_TRUE(raises([&] { repository->remove(step.name); }, kiv::messages::CannotCheckout(step.name)));
    } else {
      const kiv::Branch held = repository->getBranches().container().at(step.name);
      repository->remove(step.name);
      EXPECT_TRUE(held.isLive()) << "a removed branch leaves the map, it is not destroyed";
    }
    if (step.fails) {
      EXPECT_EQ(dumpOf(repositories), before) << "a refused step changes nothing";
    }
    EXPECT_EQ(repository->canCheckout(step.name), step.kind == MapStep::Add);
  }
  EXPECT_EQ(branchNames(repository), row.after);
  EXPECT_EQ(repository->isEmpty(), row.after.empty());
}

INSTANTIATE_TEST_SUITE_P(
    Steps, BranchMap,
    ::testing::Values(
        BranchMapCase{"AddToEmpty", {{MapStep::Add, u"a"}}, {u"a"}},
        BranchMapCase{
            "SecondOfTheSameNameRefused", {{MapStep::Add, u"a"}, {MapStep::Add, u"a", true}}, {u"a"}},
        BranchMapCase{"TwoNames", {{MapStep::Add, u"b"}, {MapStep::Add, u"a"}}, {u"a", u"b"}},
        BranchMapCase{"RemoveUnknown", {{MapStep::Add, u"a"}, {MapStep::Remove, u"b", true}}, {u"a"}},
        BranchMapCase{"RemoveFromEmpty", {{MapStep::Remove, u"master", true}}, {}},
        BranchMapCase{"RemoveThenAddAgain",
                      {{MapStep::Add, u"a"}, {MapStep::Remove, u"a"}, {MapStep::Add, u"a"}},
                      {u"a"}},
        BranchMapCase{
            "RemoveOneOfTwo", {{MapStep::Add, u"a"}, {MapStep::Add, u"b"}, {MapStep::Remove, u"a"}}, {u"b"}}),
    CaseName());

TEST_F(RepositoryCore, RemovingTheHeadLeavesTheHeadAsItWas) {
  const kiv::Branch master = origin->getHead();
  origin->remove(u"master");
  EXPECT_TRUE(origin->isEmpty());
  EXPECT_FALSE(origin->canCheckout(u"master"));
  EXPECT_EQ(origin->getHead(), master);
  EXPECT_TRUE(master.isLive());
}

// sync(other): branches only the other has are cloned into this repository's model, ours
// that the other lacks are erased, and the callback sees each pair of shared ones.
struct SyncCase {
  std::string name;
  std::vector<BranchShape> mine;
  std::u16string head;
  std::vector<BranchShape> theirs;
  Names created, deleted, shared;
  bool headDelete = false;
};

class SyncPhases : public ::testing::TestWithParam<SyncCase>, public RepositoryModels {};

TEST_P(SyncPhases, CreateDeleteThenUpdate) {
  const SyncCase& row = GetParam();
  const kiv::LocalRepository mine = makeRepository(row.mine, row.head);
  const kiv::LocalRepository theirs = makeRepository(row.theirs);
  const std::map<std::u16string, kiv::Branch> ours(mine->getBranches().container().begin(),
                                                   mine->getBranches().container().end());
  const std::string before = dumpOf(repositories);
  const kiv::RepositoryListener::BranchStates theirStates = kiv::RepositoryListener::statesOf(theirs);
  std::vector<std::u16string> updated;
  const auto record = [&](const kiv::Branch& my, const kiv::Branch& their) {
    EXPECT_EQ(my->getName(), their->getName());
    EXPECT_EQ(mine->getBranches().container().at(my->getName()), my);
    EXPECT_EQ(theirs->getBranches().container().at(their->getName()), their);
    updated.push_back(my->getName());
  };
  if (row.headDelete) {
    EXPECT_TRUE(raises([&] { mine->sync(theirs, record); }, kiv::messages::HeadDelete()));
    EXPECT_TRUE(updated.empty());
    EXPECT_EQ(dumpOf(repositories), before) << "nothing is created or erased before the head check";
    return;
  }
  mine->sync(theirs, record);
  EXPECT_EQ(branchNames(mine), branchNames(theirs));
  for (const std::u16string& name : row.shared) {
    EXPECT_EQ(std::count(updated.begin(), updated.end(), name), 1) << qf::zero::toUtf8(name);
    EXPECT_EQ(mine->getBranches().container().at(name), ours.at(name)) << "a shared branch is kept";
  }
  // A branch created by this sync may be handed to the callback as well, once at most.
  for (const std::u16string& name : updated) {
    const auto known = std::count(row.shared.begin(), row.shared.end(), name) +
                       std::count(row.created.begin(), row.created.end(), name);
    EXPECT_EQ(std::count(updated.begin(), updated.end(), name) * known, 1) << qf::zero::toUtf8(name);
  }
  for (const std::u16string& name : row.created) {
    const kiv::Branch copy = mine->getBranches().container().at(name);
    const kiv::Branch source = theirs->getBranches().container().at(name);
    EXPECT_NE(copy, source) << "a created branch is a copy";
    EXPECT_EQ(copy.getModel(), repositories);
    EXPECT_TRUE(copy->isEquivalent(source, false));
  }
  for (const std::u16string& name : row.deleted) {
    EXPECT_FALSE(mine->canCheckout(name));
    EXPECT_TRUE(ours.at(name).isLive());
  }
  EXPECT_EQ(ours.size() + row.created.size() - row.deleted.size(), mine->getBranches().size());
  EXPECT_EQ(kiv::RepositoryListener::statesOf(theirs), theirStates) << "the other repository is only read";
}

INSTANTIATE_TEST_SUITE_P(
    Rows, SyncPhases,
    ::testing::Values(SyncCase{"IdenticalSets",
                               {{u"master", "c1"}, {u"a", "c2"}},
                               u"master",
                               {{u"master", "c3"}, {u"a", "c2", {"c4"}}},
                               {},
                               {},
                               {u"a", u"master"}},
                      SyncCase{"OtherHasExtra",
                               {{u"master", "c1"}},
                               u"master",
                               {{u"master", "c1"}, {u"b", "c2", {"c3", "c4"}}},
                               {u"b"},
                               {},
                               {u"master"}},
                      SyncCase{"ThisHasExtra",
                               {{u"master", "c1"}, {u"old", "c2"}},
                               u"master",
                               {{u"master", "c1"}},
                               {},
                               {u"old"},
                               {u"master"}},
                      SyncCase{"AllThreePhases",
                               {{u"master", "c1"}, {u"old", "c2"}},
                               u"master",
                               {{u"master", "c5"}, {u"new", ""}},
                               {u"new"},
                               {u"old"},
                               {u"master"}},
                      SyncCase{"WithoutHeadEverythingMayGo", {{u"a", "c1"}}, u"", {}, {}, {u"a"}, {}},
                      SyncCase{"OtherLacksOurHead",
                               {{u"master", "c1"}, {u"a", "c2"}},
                               u"master",
                               {{u"a", "c2"}, {u"b", "c3"}},
                               {},
                               {},
                               {},
                               true}),
    CaseName());

// canPush: the repository is still in the state the history's "previous" set records.
struct CanPushCase {
  std::string name;
  std::vector<BranchShape> repository, previous, current;
  bool expected;
};

class CanPush : public ::testing::TestWithParam<CanPushCase>, public RepositoryModels {};

TEST_P(CanPush, ComparesThePreviousSet) {
  const CanPushCase& row = GetParam();
  const kiv::LocalRepository repository = makeRepository(row.repository);
  std::vector<kiv::Branch> previous, current;
  for (const BranchShape& shape : row.previous) previous.push_back(makeBranch(shape));
  for (const BranchShape& shape : row.current) current.push_back(makeBranch(shape));
  qf::zero::Transaction transaction = repositories->beginTransaction();
  const kiv::protocol::History history = kiv::protocol::History::create(repositories);
  for (const kiv::Branch& branch : previous) history->getPreviousMutable().add(branch);
  for (const kiv::Branch& branch : current) history->getCurrentMutable().add(branch);
  transaction.commit();
  ASSERT_EQ(history->getPrevious().size(), row.previous.size());
  EXPECT_EQ(repository->canPush(history), row.expected);
}

INSTANTIATE_TEST_SUITE_P(
    Rows, CanPush,
    ::testing::Values(
        CanPushCase{"EmptyAndEmpty", {}, {}, {}, true},
        CanPushCase{"SameStates",
                    {{u"master", "c1"}, {u"a", "c2", {"c3"}}},
                    {{u"master", "c1"}, {u"a", "c2", {"c3"}}},
                    {},
                    true},
        CanPushCase{"BothWithoutTip", {{u"master", ""}}, {{u"master", ""}}, {}, true},
        CanPushCase{"CurrentSetIgnored",
                    {{u"master", "c1"}},
                    {{u"master", "c1"}},
                    {{u"master", "c9"}, {u"x", "c8"}},
                    true},
        CanPushCase{"OneBranchFewer", {{u"master", "c1"}, {u"a", "c2"}}, {{u"master", "c1"}}, {}, false},
        CanPushCase{"OneBranchMore", {{u"master", "c1"}}, {{u"master", "c1"}, {u"b", "c2"}}, {}, false},
        CanPushCase{
            "OneMoreOfTheSameName", {{u"master", "c1"}}, {{u"master", "c1"}, {u"master", "c1"}}, {}, false},
        CanPushCase{"PreviousEmpty", {{u"master", "c1"}}, {}, {}, false},
        CanPushCase{
            "TipDiffers", {{u"master", "c1"}, {u"a", "c2"}}, {{u"master", "c1"}, {u"a", "c3"}}, {}, false},
        CanPushCase{"TipMissing", {{u"master", "c1"}}, {{u"master", ""}}, {}, false},
        CanPushCase{"TipGained", {{u"master", ""}}, {{u"master", "c1"}}, {}, false},
        CanPushCase{"RedoDiffers", {{u"master", "c1", {"c2"}}}, {{u"master", "c1", {"c3"}}}, {}, false},
        CanPushCase{"RedoLonger", {{u"master", "c1", {"c2"}}}, {{u"master", "c1", {"c2", "c3"}}}, {}, false},
        CanPushCase{"RedoShorter", {{u"master", "c1", {"c2", "c3"}}}, {{u"master", "c1", {"c2"}}}, {}, false},
        CanPushCase{
            "RedoOrder", {{u"master", "c1", {"c2", "c3"}}}, {{u"master", "c1", {"c3", "c2"}}}, {}, false},
        CanPushCase{"NameDiffers", {{u"master", "c1"}}, {{u"main", "c1"}}, {}, false}),
    CaseName());

// isEquivalent after an edit of a clone: the same branches with the same states and the
// same head.
struct EquivalenceCase {
  std::string name;
  std::function<void(RepositoryModels&, Clone&)> edit;
  bool equivalent;
};

class Equivalence : public ::testing::TestWithParam<EquivalenceCase>, public RepositoryModels {};

TEST_P(Equivalence, OfACloneAndItsOrigin) {
  Clone clone = cloneOrigin();
  GetParam().edit(*this, clone);
  EXPECT_EQ(clone.repository->isEquivalent(origin), GetParam().equivalent);
  EXPECT_EQ(origin->isEquivalent(clone.repository), GetParam().equivalent);
  EXPECT_TRUE(clone.repository->isEquivalent(clone.repository));
}

INSTANTIATE_TEST_SUITE_P(
    Edits, Equivalence,
    ::testing::Values(
        EquivalenceCase{"None", [](RepositoryModels&, Clone&) {}, true},
        EquivalenceCase{"CommitOnTheClone", [](RepositoryModels& m, Clone& c) { m.addNode(c, u"a"); }, false},
        EquivalenceCase{"CommitUndone",
                        [](RepositoryModels& m, Clone& c) {
                          m.addNode(c, u"a");
                          c.workspace->undo();
                        },
                        false},
        EquivalenceCase{"NewBranch", [](RepositoryModels&, Clone& c) { c.workspace->branch(u"feature"); },
                        false},
        EquivalenceCase{"CommitPushed",
                        [](RepositoryModels& m, Clone& c) {
                          m.addNode(c, u"a");
                          EXPECT_TRUE(completes(c.repository->push(kiv::PushMode::TryPush)));
                        },
                        true},
        EquivalenceCase{"OtherHeadAfterPush",
                        [](RepositoryModels& m, Clone& c) {
                          c.workspace->branch(u"feature");
                          m.addNode(c, u"a");
                          EXPECT_TRUE(completes(c.repository->push(kiv::PushMode::TryPush)));
                        },
                        false},
        // Only the redo stack of a branch that is not the head differs.
        EquivalenceCase{"UndoneOnAPushedSideBranch",
                        [](RepositoryModels& m, Clone& c) {
                          c.workspace->branch(u"feature");
                          c.workspace->checkout(u"master");
                          EXPECT_TRUE(completes(c.repository->push(kiv::PushMode::TryPush)));
                          c.workspace->checkout(u"feature");
                          m.addNode(c, u"a");
                          c.workspace->undo();
                          c.workspace->checkout(u"master");
                        },
                        false}),
    CaseName());

// Random pairs of repositories, the second often a copy of the first with at most one
// change. The branch states (name, tip, redo stack) and the head's name decide equivalence,
// whichever side asks; after syncBranches the states are the other's, and canPush accepts
// a history recording exactly this repository's states.
class RandomBranchSets : public ::testing::Test, public RepositoryModels {
 protected:
  using States = kiv::RepositoryListener::BranchStates;

  std::vector<BranchShape> randomShapes(std::mt19937& random) {
    static const std::vector<std::string> labels = {"", "c1", "c2", "c3"};
    std::vector<BranchShape> shapes;
    for (const std::u16string name : {u"master", u"a", u"b"}) {
      if (random() % 5 < 2) continue;
      BranchShape shape{name, labels[random() % labels.size()]};
      for (std::size_t n = random() % 3; n > 0; --n) shape.redo.push_back(labels[1 + random() % 3]);
      shapes.push_back(shape);
    }
    return shapes;
  }

  std::vector<BranchShape> variantOf(std::vector<BranchShape> shapes, std::mt19937& random) {
    if (shapes.empty() || random() % 4 == 0) return shapes;
    BranchShape& changed = shapes[random() % shapes.size()];
    switch (random() % 4) {
      case 0:
        changed.tip = changed.tip == "c1" ? "c2" : "c1";
        break;
      case 1:
        changed.redo.push_back("c3");
        break;
      case 2:
        if (!changed.redo.empty()) changed.redo.pop_back();
        break;
      default:
        shapes.erase(shapes.begin() + static_cast<std::ptrdiff_t>(&changed - shapes.data()));
    }
    return shapes;
  }

  static std::u16string randomHead(const std::vector<BranchShape>& shapes, std::mt19937& random) {
    if (shapes.empty() || random() % 5 == 0) return u"";
    return shapes[random() % shapes.size()].name;
  }

  static std::u16string headName(const kiv::Repository& repository) {
    return repository->getHead() ? repository->getHead()->getName() : u"-";
  }
};

TEST_F(RandomBranchSets, EquivalenceSyncAndCanPushAgreeOnBranchStates) {
  const unsigned seed = 20240611;
  std::mt19937 random(seed);
  for (int round = 0; round < 150; ++round) {
    SCOPED_TRACE("seed " + std::to_string(seed) + ", round " + std::to_string(round));
    const std::vector<BranchShape> first = randomShapes(random);
    const std::vector<BranchShape> second = random() % 2 ? variantOf(first, random) : randomShapes(random);
    const kiv::LocalRepository mine = makeRepository(first, randomHead(first, random));
    const kiv::LocalRepository theirs = makeRepository(second, randomHead(second, random));
    const States myStates = kiv::RepositoryListener::statesOf(mine);
    const States theirStates = kiv::RepositoryListener::statesOf(theirs);
    SCOPED_TRACE("heads " + qf::zero::toUtf8(headName(mine)) + " / " + qf::zero::toUtf8(headName(theirs)));

    const bool same = myStates == theirStates && headName(mine) == headName(theirs);
    EXPECT_EQ(mine->isEquivalent(theirs), same);
    EXPECT_EQ(theirs->isEquivalent(mine), same);

    qf::zero::Transaction transaction = repositories->beginTransaction();
    const kiv::protocol::History history = kiv::protocol::History::create(repositories);
    for (const auto& [name, branch] : theirs->getBranches().container())
      history->getPreviousMutable().add(branch->clone(repositories));
    transaction.commit();
    EXPECT_EQ(mine->canPush(history), myStates == theirStates);

    const bool headKept = !mine->getHead() || theirs->canCheckout(mine->getHead()->getName());
    if (headKept) {
      mine->syncBranches(theirs);
      EXPECT_EQ(kiv::RepositoryListener::statesOf(mine), theirStates);
      EXPECT_TRUE(mine->canPush(history));
    } else {
      EXPECT_THROW(mine->syncBranches(theirs), Exception<kiv::messages::HeadDelete>);
      EXPECT_EQ(kiv::RepositoryListener::statesOf(mine), myStates);
    }
    EXPECT_EQ(kiv::RepositoryListener::statesOf(theirs), theirStates);
    if (HasFailure()) return;
  }
}

struct PacketNameCase {
  std::string name;
  kiv::protocol::PacketType type;
};

class PacketName : public ::testing::TestWithParam<PacketNameCase> {};

TEST_P(PacketName, IsTheLiteralName) {
  EXPECT_EQ(kiv::Repository::Impl::toString(GetParam().type), GetParam().name);
}

INSTANTIATE_TEST_SUITE_P(
    AllTypes, PacketName,
    ::testing::Values(PacketNameCase{"OK", kiv::protocol::PacketType::OK},
                      PacketNameCase{"PullInfo", kiv::protocol::PacketType::PullInfo},
                      PacketNameCase{"RepoInfo", kiv::protocol::PacketType::RepoInfo},
                      PacketNameCase{"Pull", kiv::protocol::PacketType::Pull},
                      PacketNameCase{"History", kiv::protocol::PacketType::History},
                      PacketNameCase{"Push", kiv::protocol::PacketType::Push},
                      PacketNameCase{"CannotPush", kiv::protocol::PacketType::CannotPush},
                      PacketNameCase{"AddRemoteObserver", kiv::protocol::PacketType::AddRemoteObserver},
                      PacketNameCase{"RemoveRemoteObserver", kiv::protocol::PacketType::RemoveRemoteObserver},
                      PacketNameCase{"RepositoryModified", kiv::protocol::PacketType::RepositoryModified},
                      PacketNameCase{"Error", kiv::protocol::PacketType::Error}),
    CaseName());

TEST(PacketNameOutOfRange, IsRefused) {
  for (const int value : {-1, 11}) {
    EXPECT_THROW(kiv::Repository::Impl::toString(static_cast<kiv::protocol::PacketType>(value)),
                 Exception<qf0::messages::InvalidValue>)
        << value;
  }
}

TEST_F(RepositoryCore, AggregateTextHoldsTheRepositoryAndItsBranchesButNoCommits) {
  Clone clone = cloneOrigin();
  addNode(clone, u"a");
  clone.workspace->branch(u"feature");
  const nlohmann::ordered_json document =
      nlohmann::ordered_json::parse(kiv::Repository::Impl::serializeAggregate(clone.repository));
  std::set<std::string> ids;
  for (const auto& entry : document.at("entries")) ids.insert(entry.at("id").get<std::string>());
  EXPECT_TRUE(ids.count(qf::zero::toText(clone.repository.getUuid())));
  for (const auto& [name, branch] : clone.repository->getBranches().container()) {
    EXPECT_TRUE(ids.count(qf::zero::toText(branch.getUuid()))) << qf::zero::toUtf8(name);
  }
  EXPECT_FALSE(ids.count(qf::zero::toText(clone.tip().getUuid())));
  EXPECT_FALSE(ids.count(qf::zero::toText(origin.getUuid())));
  EXPECT_THROW(kiv::Repository::Impl::serializeAggregate(ModelElement()),
               Exception<qf0::messages::ElementRequired>);
}

}  // namespace
}  // namespace repository_test
