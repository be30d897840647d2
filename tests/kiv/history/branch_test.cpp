// Branches: committing, undo and redo, mirroring, cloning, merging through a strategy,
// and equivalence of branches and branch maps.
#include "history_fixture.h"
#include "kiv/merge/merge_strategy.h"
#include "kiv/metamodel/branch_impl.h"

namespace {

using namespace history_test;

// A commit with a one-storage delta, so that it can be undone.
kiv::Commit commitOn(const Model& model, const kiv::Commit& parent = {}, const qf::zero::Uuid& id = {}) {
  const kiv::ObjectStorage storage =
      kiv::ObjectStorage::Builder(model).doSetElementUUID(qf::zero::generateNewUuid()).create();
  kiv::Commit commit = kiv::Commit::Builder(model)
                           .doSetDelta(kiv::Delta::Builder(model).doAddCurrent(storage).create())
                           .create(id);
  if (parent) commit->addParent(parent);
  return commit;
}

// The same commit in another model: same UUID, parents mapped by UUID.
kiv::Commit copyInto(const Model& model, const kiv::Commit& commit) {
  const kiv::Commit copy = kiv::Commit::create(model, commit.getUuid());
  for (const kiv::Commit& parent : commit.getParents().getTypedValues()) {
    copy->addParent(qf::zero::elementCast<kiv::Commit>(model->findElement(parent.getUuid())));
  }
  return copy;
}

struct ScriptedStrategy : kiv::IMergeStrategy {
  std::function<kiv::Commit(const kiv::Commit&, const kiv::Commit&)> script;
  mutable std::vector<std::pair<kiv::Commit, kiv::Commit>> calls;
  kiv::Commit run(const kiv::Commit& ours, const kiv::Commit& theirs) const override {
    calls.emplace_back(ours, theirs);
    return script(ours, theirs);
  }
};

class Branches : public ::testing::Test {
 protected:
  kiv::Branch branchNamed(const std::u16string& name, const Model& in) {
    return kiv::Branch::Builder(in).doSetName(name).create();
  }
  std::string dump(const kiv::Branch& branch) {
    std::string text = branch.getTip() ? branch.getTip().identifier() : "-";
    for (const kiv::Commit& c : branch.getRedoStack().getTypedValues()) text += " " + c.identifier();
    return text;
  }

  Model model = Model::create();
  kiv::Branch branch = branchNamed(u"master", model);
};

TEST_F(Branches, ANewBranchIsEmptyAndTakesAnyCommit) {
  EXPECT_TRUE(branch->isEmpty());
  EXPECT_FALSE(branch->canUndo());
  EXPECT_FALSE(branch->canRedo());
  const kiv::Commit initial = commitOn(model);
  EXPECT_TRUE(branch->canCommit(initial));
  EXPECT_FALSE(branch->canCommit(kiv::Commit()));
  branch->commit(initial);
  EXPECT_EQ(branch.getTip(), initial);
  EXPECT_FALSE(branch->canCommit(commitOn(model))) << "an initial commit onto a branch with a tip";
  EXPECT_FALSE(branch->canCommit(commitOn(model, commitOn(model)))) << "its first parent is not the tip";
}

TEST_F(Branches, UndoAndRedoMoveTheTipAlongFirstParents) {
  const kiv::Commit a = commitOn(model);
  const kiv::Commit b = commitOn(model, a);
  const kiv::Commit c = commitOn(model, b);
  for (const kiv::Commit& commit : {a, b, c}) branch->commit(commit);

  const kiv::Delta inverse = branch->undo();
  EXPECT_EQ(branch.getTip(), b);
  EXPECT_EQ(branch.getRedoStack().getTypedValues(), std::vector<kiv::Commit>{c});
  EXPECT_EQ(inverse.getPrevious().getTypedValues(), c.getDelta().getCurrent().getTypedValues())
      << "shared storages";
  branch->undo();
  EXPECT_EQ(branch.getRedoStack().getTypedValues(), (std::vector<kiv::Commit>{c, b}))
      << "most recently undone last";

  EXPECT_EQ(branch->redo(), b.getDelta()) << "the redone commit's own delta";
  EXPECT_EQ(branch.getTip(), b);
  EXPECT_EQ(branch.getRedoStack().getTypedValues(), std::vector<kiv::Commit>{c});

  const kiv::Commit other = commitOn(model, b);
  branch->commit(other);
  EXPECT_EQ(branch.getRedoStack().size(), 0u) << "a new commit discards what could be redone";
}

TEST_F(Branches, UndoingTheInitialCommitLeavesNoTipButSomethingToRedo) {
  const kiv::Commit a = commitOn(model);
  branch->commit(a);
  branch->undo();
  EXPECT_FALSE(branch.getTip());
  EXPECT_FALSE(branch->isEmpty());
  EXPECT_FALSE(branch->canUndo());
  branch->redo();
  EXPECT_EQ(branch.getTip(), a);
}

TEST_F(Branches, RefusedMovesLeaveTheBranchAsItWas) {
  const kiv::Commit a = commitOn(model);
  EXPECT_THROW(branch->undo(), Exception<kiv::messages::CannotUndo>);
  EXPECT_THROW(branch->redo(), Exception<kiv::messages::CannotRedo>);
  branch->commit(a);
  branch->commit(commitOn(model, a));
  branch->undo();
  const std::string before = dump(branch);
  EXPECT_THROW(branch->commit(commitOn(model)), Exception<kiv::messages::CannotCommit>);
  EXPECT_EQ(before, dump(branch)) << "the redo stack is kept";

  const kiv::Commit bare = kiv::Commit::create(model);  // no delta: nothing to undo
  bare->addParent(a);
  branch->commit(bare);
  EXPECT_THROW(branch->undo(), Exception<kiv::messages::CannotUndo>);
  EXPECT_THROW(branch->redo(), Exception<kiv::messages::CannotRedo>);
  EXPECT_EQ(branch.getTip(), bare);
}

TEST_F(Branches, MergeGivesTheStrategysCommitOursAndTheirsAsParents) {
  const kiv::Commit base = commitOn(model);
  const kiv::Commit ours = commitOn(model, base);
  const kiv::Commit theirs = commitOn(model, base);
  branch->commit(base);
  branch->commit(ours);
  kiv::Branch feature = branchNamed(u"feature", model);

  ScriptedStrategy strategy;
  strategy.script = [&](const kiv::Commit&, const kiv::Commit&) { return kiv::Commit::create(model); };
  branch->merge(feature, strategy);
  EXPECT_TRUE(strategy.calls.empty()) << "theirs has no tip: nothing to merge";

  feature->commit(theirs);
  branch->merge(feature, strategy);
  ASSERT_EQ(strategy.calls.size(), 1u);
  EXPECT_EQ(strategy.calls[0], std::make_pair(ours, theirs));
  const kiv::Commit merged = branch.getTip();
  EXPECT_EQ(merged.getParents().getTypedValues(), (std::vector<kiv::Commit>{ours, theirs})) << "ours first";

  const kiv::Branch empty = branchNamed(u"empty", model);
  empty->merge(feature, strategy);
  EXPECT_EQ(empty.getTip(), theirs) << "an empty branch fast-forwards";
  EXPECT_EQ(strategy.calls.size(), 1u) << "without asking the strategy";
}

TEST_F(Branches, AFailingMergeLeavesNothingBehind) {
  const kiv::Commit base = commitOn(model);
  branch->commit(base);
  kiv::Branch feature = branchNamed(u"feature", model);
  feature->commit(commitOn(model, base));
  const std::size_t elements = model->getElementCount();
  ScriptedStrategy strategy;
  strategy.script = [&](const kiv::Commit&, const kiv::Commit&) -> kiv::Commit {
    kiv::Commit::create(model);
    qf::zero::reportException(kiv::messages::NoUniqueLCA());
  };
  EXPECT_THROW(branch->merge(feature, strategy), Exception<kiv::messages::NoUniqueLCA>);
  strategy.script = [](const kiv::Commit&, const kiv::Commit&) { return kiv::Commit(); };
  EXPECT_THROW(branch->merge(feature, strategy), Exception<qf0::messages::ElementRequired>);
  EXPECT_EQ(branch.getTip(), base);
  EXPECT_EQ(model->getElementCount(), elements);
}

class MirroredBranches : public Branches {
 protected:
  void SetUp() override {
    const kiv::Commit a = commitOn(model);
    const kiv::Commit b = commitOn(model, a);
    const kiv::Commit c = commitOn(model, b);
    for (const kiv::Commit& commit : {a, b, c}) branch->commit(commit);
    branch->undo();
    for (const kiv::Commit& commit : {a, b, c}) copyInto(elsewhere, commit);
  }
  Model elsewhere = Model::create();
};

TEST_F(MirroredBranches, ACloneMirrorsTheBranchByCommitIdentity) {
  const kiv::Branch clone = branch->clone(elsewhere);
  EXPECT_EQ(clone.getModel(), elsewhere);
  EXPECT_EQ(clone.getName(), u"master");
  EXPECT_EQ(dump(clone), dump(branch));
  EXPECT_NE(clone.getTip(), branch.getTip()) << "the target model's own commits";
  EXPECT_TRUE(clone->isEquivalent(branch, false));
  EXPECT_TRUE(branch->isEquivalent(clone, false));
  EXPECT_FALSE(branch->isEquivalent(clone, true)) << "the copies hold no deltas, so they are not equal";
}

TEST_F(MirroredBranches, MirroringACommitTheTargetLacksFailsWithoutATrace) {
  branch->commit(commitOn(model, branch.getTip()));  // not copied
  const std::size_t elements = elsewhere->getElementCount();
  EXPECT_THROW(branch->clone(elsewhere), Exception<kiv::messages::CannotFindElement>);
  EXPECT_EQ(elsewhere->getElementCount(), elements) << "no half-made branch";
  const kiv::Branch mirror = branchNamed(u"mirror", elsewhere);
  EXPECT_THROW(mirror->update(branch), Exception<kiv::messages::CannotFindElement>);
  EXPECT_TRUE(mirror->isEmpty());
}

TEST_F(Branches, EquivalenceComparesTipsRedoStacksAndNames) {
  const kiv::Commit a = commitOn(model);
  const kiv::Commit b = commitOn(model, a);
  const kiv::Branch first = branchNamed(u"twin", model);
  const kiv::Branch second = branchNamed(u"twin", model);
  for (const kiv::Branch& each : {first, second}) {
    each->commit(a);
    each->commit(b);
    each->undo();
  }
  EXPECT_TRUE(first->isEquivalent(second, true));
  EXPECT_TRUE(first->isEquivalent(second, false));
  first->undo();
  EXPECT_FALSE(first->isEquivalent(second, true)) << "tips differ";
  second->undo();
  EXPECT_TRUE(first->isEquivalent(second, true));

  const kiv::Branch renamed = branchNamed(u"other", model);
  renamed->update(first);
  EXPECT_EQ(dump(renamed), dump(first));
  EXPECT_FALSE(renamed->isEquivalent(first, false)) << "differs only in name";
  EXPECT_FALSE(first->isEquivalent(kiv::Branch(), true));
}

// Callers compare branches whose stacks were copied one from the other, so only this
// branch's stack is walked and lengths are not compared.
TEST_F(Branches, EquivalenceOfARedoStackIsOneSided) {
  const kiv::Commit a = commitOn(model);
  const kiv::Commit b = commitOn(model, a);
  const kiv::Branch mine = branchNamed(u"x", model);
  const kiv::Branch theirs = branchNamed(u"x", model);
  for (const kiv::Branch& each : {mine, theirs}) each->commit(a);
  theirs->commit(b);
  theirs->undo();
  EXPECT_TRUE(mine->isEquivalent(theirs, true)) << "only this branch's stack is walked";
  EXPECT_FALSE(theirs->isEquivalent(mine, true)) << "an entry without counterpart";
}

TEST_F(Branches, BranchMapsAreEquivalentNameByName) {
  const kiv::Commit a = commitOn(model);
  const auto map = [&](std::initializer_list<std::u16string> names) {
    std::map<std::u16string, kiv::Branch> branches;
    for (const auto& name : names) {
      branches[name] = branchNamed(name, model);
      branches[name]->commit(a);
    }
    return branches;
  };
  EXPECT_TRUE(kiv::Branch::Impl::areBranchMapsEquivalent({}, {}));
  EXPECT_TRUE(kiv::Branch::Impl::areBranchMapsEquivalent(map({u"a", u"b"}), map({u"a", u"b"})));
  EXPECT_FALSE(kiv::Branch::Impl::areBranchMapsEquivalent(map({u"a", u"b"}), map({u"a", u"b", u"c"})));
  EXPECT_FALSE(kiv::Branch::Impl::areBranchMapsEquivalent(map({u"a", u"b", u"c"}), map({u"a", u"b"})));
  EXPECT_FALSE(kiv::Branch::Impl::areBranchMapsEquivalent(map({u"a", u"b"}), map({u"a", u"c"})));
}

TEST_F(Branches, FindingACommitByUuidNeedsItInThisModel) {
  const kiv::Commit here = commitOn(model);
  EXPECT_EQ(branch->findCommitByUUID(here), here);
  const kiv::Commit stranger = commitOn(Model::create());
  try {
    branch->findCommitByUUID(stranger);
    FAIL() << "found a commit of another model";
  } catch (const Exception<kiv::messages::CannotFindElement>& e) {
    EXPECT_NE(std::string(e.what()).find(stranger.identifier()), std::string::npos) << e.what();
  }
  EXPECT_FALSE(branch->isPredecessorOf(branch)) << "no tips yet";
  branch->commit(here);
  const kiv::Branch ahead = branchNamed(u"ahead", model);
  ahead->commit(here);
  ahead->commit(commitOn(model, here));
  EXPECT_TRUE(branch->isPredecessorOf(ahead));
  EXPECT_FALSE(ahead->isPredecessorOf(branch));
}

}  // namespace
