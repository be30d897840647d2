// How user transactions become commits, and the workspace operations that make or refuse
// commits in unusual situations.
#include "kiv/workspace/workspace_fixture.h"
#include "qf/zero/core/text.h"

#include <unordered_set>

namespace workspace_test {
namespace {

class CommitProduction : public ::testing::Test, public RepositoryModels {
 protected:
  std::u16string nameOf(const ModelElement& e) const {
    return e.getPropertyValue(tm.name).getValue<std::u16string>();
  }
};

TEST_F(CommitProduction, OneUserTransactionOfEitherKindIsOneCommitOnTheTip) {
  Clone clone = cloneOrigin();
  ModelElement a = addNode(clone, u"a");
  kiv::Commit before = clone.tip();
  clone.workspace->commitTransaction([&] {
    tm.setName(a, u"b");
    tm.refs(a, tm.children)->add(tm.leaf.instantiate(clone.user));
  });
  EXPECT_EQ(clone.tip()->getParent(), before);
  before = clone.tip();
  std::size_t arguments = 99;
  clone.workspace->commitTransaction(qf::zero::HxArray([&](const std::vector<qf::zero::Value>& args) {
    arguments = args.size();
    tm.setName(a, u"c");
    tm.node.instantiate(clone.user);
    return std::vector<qf::zero::Value>();
  }));
  EXPECT_EQ(arguments, 0u);
  EXPECT_EQ(clone.tip()->getParent(), before);
  EXPECT_EQ(clone.workspace->getContext(), clone.tip());
  EXPECT_EQ(stateOf(clone.user).size(), 3u);
}

// The deleted elements' previous content is what the earlier commits recorded, so undo
// brings them back as they were.
TEST_F(CommitProduction, ATransactionThatOnlyDestroysTakesThePreviousContentFromHistory) {
  Clone clone = cloneOrigin();
  ModelElement a = addNode(clone, u"a");
  ModelElement b = addNode(clone, u"b");
  rename(clone, a, u"a2");
  const State before = stateOf(clone.user);
  const kiv::Commit last = clone.tip();
  const qf::zero::Uuid ida = a.getUuid(), idb = b.getUuid();
  clone.workspace->commitTransaction([&] {
    a.destroy();
    b.destroy();
  });
  const kiv::Commit destroying = clone.tip();
  ASSERT_EQ(destroying->getParent(), last);
  const kiv::Delta delta = destroying->getDelta();
  ASSERT_TRUE(delta);
  EXPECT_EQ(delta->getCurrent().size(), 0u);
  EXPECT_EQ(delta->getPrevious().size(), 2u);
  for (const qf::zero::Uuid& id : {ida, idb}) {
    ASSERT_TRUE(delta->getPrevious(id));
    EXPECT_EQ(delta->getPrevious(id)->getContent(), last->find(id)->getContent());
  }
  EXPECT_TRUE(stateOf(clone.user).empty());
  clone.workspace->undo();
  EXPECT_EQ(stateOf(clone.user), before);
  clone.workspace->redo();
  EXPECT_TRUE(stateOf(clone.user).empty());
}

// The producer's rewrites make elements anew under their UUIDs, so the test finds them again
// by UUID.
TEST_F(CommitProduction, RewritesThroughTheProducerOrTheWorkspaceMakeNoCommit) {
  Clone clone = cloneOrigin();
  const qf::zero::Uuid id = addNode(clone, u"a").getUuid();
  rename(clone, clone.user->findElement(id), u"b");
  const State named = stateOf(clone.user);
  const kiv::Commit tip = clone.tip();
  const std::size_t commits = commitCount(repositories);
  kiv::CommitProducer& producer = *clone.workspace->getCommitProducer();

  producer.clearModel();
  EXPECT_TRUE(stateOf(clone.user).empty());
  kiv::Delta state = tip->getSnapshot();
  producer.update(state);
  state.destroy();
  EXPECT_EQ(stateOf(clone.user), named);
  kiv::Delta back = tip->getDelta()->invert();
  clone.workspace->update(back);
  back.destroy();
  ASSERT_TRUE(clone.user->findElement(id));
  EXPECT_EQ(nameOf(clone.user->findElement(id)), u"a");

  EXPECT_EQ(clone.tip(), tip);
  EXPECT_EQ(commitCount(repositories), commits);
  EXPECT_TRUE(producer.isEnabled());
  rename(clone, clone.user->findElement(id), u"c");
  EXPECT_EQ(clone.tip()->getParent(), tip);
}

// A transaction that changed nothing still makes a commit, one without a delta.
// A transaction that changes nothing is recorded, and the workspace does not take the
// empty commit: the head stays where it was and undo still steps back.
TEST_F(CommitProduction, ATransactionThatChangesNothingLeavesTheHeadWhereItWas) {
  Clone clone = cloneOrigin();
  addNode(clone, u"a");
  const State before = stateOf(clone.user);
  const kiv::Commit last = clone.tip();
  clone.workspace->commitTransaction([] {});
  EXPECT_EQ(clone.tip(), last);
  EXPECT_EQ(clone.workspace->getContext(), last);
  ASSERT_TRUE(clone.workspace->canUndo());
  clone.workspace->undo();
  EXPECT_TRUE(stateOf(clone.user).empty());
  clone.workspace->redo();
  EXPECT_EQ(stateOf(clone.user), before);
}

// The head moved away from the context behind the workspace's back: the producer's commit
// is made but belongs to no branch, and the committer hears "CannotCommit".
struct Behind {
  std::string name;
  std::function<void(RepositoryModels&, Clone&)> moveHead;
};

class ContextBehindTheHead : public ::testing::TestWithParam<Behind>, public RepositoryModels {};

TEST_P(ContextBehindTheHead, LeavesTheProducersCommitUnattached) {
  Clone clone = cloneOrigin();
  ModelElement a = addNode(clone, u"a");
  ASSERT_NO_FATAL_FAILURE(GetParam().moveHead(*this, clone));
  ASSERT_FALSE(clone.workspace->canCommit());
  const kiv::Commit tip = clone.tip();
  std::unordered_set<ModelElement> before;
  for (const ModelElement& e : repositories->getInstances(
           kiv::Commit::metaClass(), qf::zero::query::SearchClassMatchMode::IncludeSubclasses)) {
    before.insert(e);
  }
  EXPECT_THROW(rename(clone, a, u"lost"), Exception<kiv::messages::CannotCommit>);
  std::vector<kiv::Commit> made;
  for (const ModelElement& e : repositories->getInstances(
           kiv::Commit::metaClass(), qf::zero::query::SearchClassMatchMode::IncludeSubclasses)) {
    if (!before.count(e)) made.push_back(qf::zero::elementCast<kiv::Commit>(e));
  }
  ASSERT_EQ(made.size(), 1u);
  EXPECT_EQ(made[0]->getParent(), tip);
  EXPECT_EQ(clone.tip(), tip);
  for (const auto& [name, branch] : clone.repository->getBranches().container()) {
    EXPECT_NE(branch->getTip(), made[0]) << qf::zero::toUtf8(name);
    EXPECT_FALSE(branch->getRedoStack().contains(made[0]));
  }
  EXPECT_EQ(a.getPropertyValue(tm.name).getValue<std::u16string>(), u"lost");
}

const Behind movesOfTheHead[] = {
    {"RepositoryCheckout",
     [](RepositoryModels& m, Clone& clone) {
       clone.workspace->branch(u"feature");
       m.addNode(clone, u"f");
       clone.repository->checkout(u"master");
     }},
    {"RepositoryPull",
     [](RepositoryModels& m, Clone& clone) {
       ASSERT_TRUE(completes(clone.workspace->push(kiv::PushMode::TryPush)));
       Clone other = m.cloneOrigin();
       m.addNode(other, u"o");
       ASSERT_TRUE(completes(other.workspace->push(kiv::PushMode::TryPush)));
       ASSERT_TRUE(completes(clone.repository->pull()));
     }},
};

INSTANTIATE_TEST_SUITE_P(Moves, ContextBehindTheHead, ::testing::ValuesIn(movesOfTheHead), RowName());

TEST_F(CommitProduction, BranchingWithNoContextStartsAnEmptyLine) {
  Clone clone = cloneOrigin();
  addNode(clone, u"a");
  const kiv::Commit master = clone.tip();
  const State onMaster = stateOf(clone.user);
  clone.workspace->setContext(kiv::Commit(), kiv::SetContextMode::ContextOnly);
  clone.workspace->branch(u"topic");
  EXPECT_EQ(clone.head()->getName(), u"topic");
  EXPECT_FALSE(clone.tip());
  EXPECT_TRUE(stateOf(clone.user).empty());
  ASSERT_TRUE(clone.workspace->canCommit());
  addNode(clone, u"t");
  EXPECT_TRUE(clone.tip()->isInitial());
  EXPECT_EQ(clone.repository->getBranches().container().at(u"master")->getTip(), master);
  // The two lines share no commit: the way back is through both whole states.
  clone.workspace->checkout(u"master");
  EXPECT_EQ(stateOf(clone.user), onMaster);
}

// A snapshot holds the whole state: walks from no context stop at it, and walks across it
// in either direction still give each recorded state.
TEST_F(CommitProduction, ASnapshotCommitHoldsTheWholeStateOfTheUserModel) {
  Clone clone = cloneOrigin();
  StateRecorder recorder(clone);
  ModelElement a = addNode(clone, u"a");
  clone.workspace->commitTransaction(
      [&] { tm.refs(a, tm.children)->add(tm.gadget.instantiate(clone.user)); });
  const kiv::Commit beforeSnapshot = clone.tip();
  const std::string user = dumpOf(clone.user);
  clone.workspace->takeSnapshot();
  const kiv::Commit snapshot = clone.tip();
  EXPECT_EQ(snapshot->getParent(), beforeSnapshot);
  EXPECT_TRUE(snapshot->getDelta()->getIsSnapshot());
  EXPECT_EQ(clone.workspace->getContext(), snapshot);
  EXPECT_EQ(dumpOf(clone.user), user);
  rename(clone, a, u"after");
  const kiv::Commit after = clone.tip();
  recorder.recording = false;
  const State& at = recorder.at(beforeSnapshot);

  const auto expectState = [&](const State& expected, const char* where) {
    SCOPED_TRACE(where);
    EXPECT_EQ(stateOf(clone.user), expected);
  };
  clone.workspace->setContext(beforeSnapshot, kiv::SetContextMode::ContextOnly);
  expectState(at, "backwards across the snapshot");
  clone.workspace->setContext(after, kiv::SetContextMode::ContextOnly);
  expectState(recorder.at(after), "forwards across the snapshot");
  clone.workspace->setContext(kiv::Commit(), kiv::SetContextMode::ContextOnly);
  clone.workspace->setContext(snapshot, kiv::SetContextMode::ContextOnly);
  expectState(at, "from no context");
  clone.workspace->updateContext();
  clone.workspace->undo();
  expectState(at, "undo to the snapshot");
  clone.workspace->undo();
  expectState(at, "undo of the snapshot");
  clone.workspace->redo();
  clone.workspace->redo();
  expectState(recorder.at(after), "redone");

  Model fresh = Model::create();
  kiv::LocalRepository reopened = kiv::LocalRepository::clone(clone.repository, kiv::RepoType::Regular);
  kiv::loadContext(reopened->getWorkspace(fresh));
  EXPECT_EQ(stateOf(fresh), recorder.at(after));
}

// The workspace dies with its element or its repository's; production stops with it and
// goes on when the destruction is cancelled.
struct Destruction {
  std::string name;
  bool wholeRepository;
  bool cancelled;
};

class WorkspaceDestruction : public ::testing::TestWithParam<Destruction>, public RepositoryModels {};

TEST_P(WorkspaceDestruction, StopsCommitProductionUnlessCancelled) {
  const Destruction& row = GetParam();
  Clone clone = cloneOrigin();
  ModelElement a = addNode(clone, u"a");
  const kiv::Commit tip = clone.tip();
  {
    qf::zero::Transaction transaction = repositories->beginTransaction();
    (row.wholeRepository ? ModelElement(clone.repository) : ModelElement(clone.workspace)).destroy();
    if (row.cancelled) {
      transaction.cancel();
    } else {
      transaction.commit();
    }
  }
  EXPECT_EQ(clone.workspace.isLive(), row.cancelled);
  const std::size_t commits = commitCount(repositories);
  tm.setName(a, u"edited");  // a user transaction of its own
  if (row.cancelled) {
    EXPECT_EQ(clone.tip()->getParent(), tip);
    EXPECT_EQ(clone.workspace->getContext(), clone.tip());
  } else {
    EXPECT_EQ(commitCount(repositories), commits);
  }
  EXPECT_EQ(a.getPropertyValue(tm.name).getValue<std::u16string>(), u"edited");
}

INSTANTIATE_TEST_SUITE_P(Rows, WorkspaceDestruction,
                         ::testing::Values(Destruction{"Workspace", false, false},
                                           Destruction{"WorkspaceCancelled", false, true},
                                           Destruction{"Repository", true, false},
                                           Destruction{"RepositoryCancelled", true, true}),
                         RowName());

}  // namespace
}  // namespace workspace_test
