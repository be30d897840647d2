// A workspace operation that fails leaves the repository model and the user model exactly as
// they were, and the workspace still turns the next user transaction into a commit. Failures
// are injected at every transaction either model validates during the operation, and by
// arguments and set-ups the operation refuses.
#include "kiv/workspace/workspace_fixture.h"

#include <iostream>

namespace workspace_test {
namespace {

using Mode = kiv::SetContextMode;

// master: c1 (a made), c2 (a renamed), c3 (b made), and c4 (a renamed again) undone onto
// the redo stack; "feature" from c3: f1 (f made), f2 (b renamed). The workspace is on master
// at c3.
struct World : RepositoryModels {
  World() {
    clone = cloneOrigin();
    a = addNode(clone, u"a");
    c1 = clone.tip();
    rename(clone, a, u"a1");
    c2 = clone.tip();
    b = addNode(clone, u"b");
    c3 = clone.tip();
    clone.workspace->branch(u"feature");
    addNode(clone, u"f");
    f1 = clone.tip();
    rename(clone, b, u"b2");
    f2 = clone.tip();
    clone.workspace->checkout(u"master");
    rename(clone, a, u"a3");
    c4 = clone.tip();
    clone.workspace->undo();
  }

  Dumps dumps() const { return dumpsOf(repositories, clone.user); }

  // When the workspace may commit, one more user transaction is one more commit on the head.
  void expectStillProducing() {
    if (!clone.workspace.isLive() || !clone.workspace->canCommit()) return;
    const kiv::Commit before = clone.tip();
    addNode(clone, u"later");
    EXPECT_NE(clone.tip(), before);
    EXPECT_EQ(clone.tip()->getParent(), before);
  }

  void destroyInTransaction(ModelElement element) {
    qf::zero::Transaction transaction = repositories->beginTransaction();
    element.destroy();
    transaction.commit();
  }

  Clone clone;
  ModelElement a, b;
  kiv::Commit c1, c2, c3, c4, f1, f2;
  Model otherUser = Model::create();
  Model elsewhere = Model::create();
  kiv::LocalRepository fresh;
  kiv::Commit spareCommit;  // made by a row's preparation
  kiv::Delta spareDelta;
};

using Step = std::function<void(World&)>;

const Step nothing = [](World&) {};

Step setContext(kiv::Commit World::*target, Mode mode) {
  return
      [target, mode](World& w) { w.clone.workspace->setContext(target ? w.*target : kiv::Commit(), mode); };
}

struct Operation {
  std::string name;
  Step prepare;
  Step run;
};

std::vector<Operation> operations() {
  std::vector<Operation> rows = {
      {"CommitTransaction", nothing,
       [](World& w) {
         w.clone.workspace->commitTransaction([&] {
           w.tm.setName(w.a, u"x");
           w.tm.node.instantiate(w.clone.user);
         });
       }},
      {"CommitTransactionOfAHostCallback", nothing,
       [](World& w) {
         w.clone.workspace->commitTransaction(qf::zero::HxArray([&](const std::vector<qf::zero::Value>&) {
           w.tm.setName(w.b, u"y");
           return std::vector<qf::zero::Value>();
         }));
       }},
      {"CommitTransactionThatOnlyDestroys", nothing,
       [](World& w) { w.clone.workspace->commitTransaction([&] { w.b.destroy(); }); }},
      {"Undo", nothing, [](World& w) { w.clone.workspace->undo(); }},
      {"Redo", nothing, [](World& w) { w.clone.workspace->redo(); }},
      {"UpdateContext", setContext(&World::c1, Mode::ContextOnly),
       [](World& w) { w.clone.workspace->updateContext(); }},
      {"Checkout", nothing, [](World& w) { w.clone.workspace->checkout(u"feature"); }},
      {"Branch", nothing, [](World& w) { w.clone.workspace->branch(u"topic"); }},
      {"Merge", nothing, [](World& w) { w.clone.workspace->merge(u"feature"); }},
      {"TakeSnapshot", nothing, [](World& w) { w.clone.workspace->takeSnapshot(); }},
      {"Update", nothing, [](World& w) { w.clone.workspace->update(w.c4->getDelta()); }},
      {"LoadContext",
       [](World& w) {
         w.clone.user = Model::create();
         w.clone.workspace = w.clone.repository->getWorkspace(w.clone.user);
       },
       [](World& w) { kiv::loadContext(w.clone.workspace); }},
      {"Init", [](World& w) { w.fresh = kiv::LocalRepository::create(w.repositories, Model::create()); },
       [](World& w) { w.fresh->init(kiv::RepoType::Regular); }},
      {"Create", nothing, [](World& w) { kiv::LocalRepository::create(w.repositories, Model::create()); }},
      {"Clone", nothing, [](World& w) { kiv::LocalRepository::clone(w.origin, kiv::RepoType::Regular); }},
      {"GetWorkspaceOfAnotherModel", nothing,
       [](World& w) { w.clone.repository->getWorkspace(w.otherUser); }},
  };
  // The rewrites of setContext: to no commit, from no commit, forwards, backwards, and
  // across branches (neither context precedes the other), in both modes.
  const std::pair<Mode, std::string> modes[] = {{Mode::ContextOnly, "ContextOnly"},
                                                {Mode::BranchUpdate, "BranchUpdate"}};
  for (const auto& [mode, tail] : modes) {
    rows.push_back({"SetContextToNothing" + tail, nothing, setContext(nullptr, mode)});
    rows.push_back({"SetContextFromNothing" + tail, setContext(nullptr, Mode::ContextOnly),
                    setContext(&World::c2, mode)});
    rows.push_back({"SetContextForwards" + tail, setContext(&World::c1, Mode::ContextOnly),
                    setContext(&World::c4, mode)});
    rows.push_back({"SetContextBackwards" + tail, nothing, setContext(&World::c1, mode)});
    rows.push_back({"SetContextAcrossBranches" + tail, [](World& w) { w.clone.workspace->redo(); },
                    setContext(&World::f2, mode)});
  }
  return rows;
}

class FailureAtomicity : public ::testing::TestWithParam<Operation> {};

// A clean run counts the transactions each model validates during the operation; then each
// of them in turn is vetoed in a fresh world.
TEST_P(FailureAtomicity, AVetoOfAnyTransactionOfEitherModelChangesNothing) {
  const Operation& operation = GetParam();
  int points[2] = {0, 0};  // user, repository
  {
    World world;
    operation.prepare(world);
    Veto user(world.clone.user), repository(world.repositories);
    ASSERT_NO_THROW(operation.run(world)) << "the operation fails without an injected failure";
    points[0] = user.seen();
    points[1] = repository.seen();
  }
  ASSERT_GT(points[0] + points[1], 0);
  std::cout << "[ points   ] " << operation.name << ": " << points[0] << " user, " << points[1]
            << " repository\n";
  for (int onRepository : {0, 1}) {
    for (int at = 1; at <= points[onRepository]; ++at) {
      SCOPED_TRACE(std::string(onRepository ? "repository" : "user") + " transaction " + std::to_string(at) +
                   " vetoed");
      World world;
      operation.prepare(world);
      const Dumps before = world.dumps();
      {
        Veto veto(onRepository ? world.repositories : world.clone.user, at);
        EXPECT_THROW(operation.run(world), Injected);
      }
      const Dumps after = world.dumps();
      EXPECT_EQ(after.repositories, before.repositories) << "the repository model changed";
      EXPECT_EQ(after.user, before.user) << "the user model changed";
      if (after == before) world.expectStillProducing();
    }
  }
}

INSTANTIATE_TEST_SUITE_P(Operations, FailureAtomicity, ::testing::ValuesIn(operations()), RowName());

// What a refused call raises: an injected failure, std::bad_function_call, or a library
// error with `message`.
enum class Raises { Injected, BadCall, Library };

struct RefusedCall {
  std::string name;
  Step prepare;
  Step run;
  Raises raises;
  std::function<foundation::core::except::MessageId()> message = {};
};

template <class M, class... Args>
std::function<foundation::core::except::MessageId()> message(Args... args) {
  return [=] { return M(args...).id(); };
}

const std::vector<RefusedCall> refusedCalls = {
    {"CheckoutOfAnUnknownBranch", nothing, [](World& w) { w.clone.workspace->checkout(u"no/such ✓"); },
     Raises::Library, message<kiv::messages::CannotCheckout>(std::u16string(u"no/such ✓"))},
    {"MergeOfAnUnknownBranch", nothing, [](World& w) { w.clone.workspace->merge(u"no/such ✓"); },
     Raises::Library, message<kiv::messages::CannotCheckout>(std::u16string(u"no/such ✓"))},
    {"CheckoutOfADestroyedBranch",
     [](World& w) {
       w.clone.workspace->checkout(u"master");
       w.destroyInTransaction(w.clone.repository->getBranches().container().at(u"feature"));
     },
     [](World& w) { w.clone.workspace->checkout(u"feature"); }, Raises::Library,
     message<kiv::messages::CannotCheckout>(std::u16string(u"feature"))},
    {"BranchUnderATakenName", nothing, [](World& w) { w.clone.workspace->branch(u"feature"); },
     Raises::Library, message<kiv::messages::BranchExists>(std::u16string(u"feature"))},
    {"InitOfAnInitialisedRepository", nothing,
     [](World& w) { w.clone.repository->init(kiv::RepoType::Regular); }, Raises::Library,
     message<kiv::messages::BranchExists>(std::u16string(u"master"))},
    {"MergeThroughAFailingStrategy",
     [](World& w) { installStrategy(w.clone.repository, std::make_shared<FailingStrategy>()); },
     [](World& w) { w.clone.workspace->merge(u"feature"); }, Raises::Injected},
    {"UndoWithNothingToUndo",
     [](World& w) {
       while (w.clone.workspace->canUndo()) w.clone.workspace->undo();
     },
     [](World& w) { w.clone.workspace->undo(); }, Raises::Library, message<kiv::messages::CannotUndo>()},
    {"RedoWithNothingToRedo", [](World& w) { w.clone.workspace->redo(); },
     [](World& w) { w.clone.workspace->redo(); }, Raises::Library, message<kiv::messages::CannotRedo>()},
    {"SetContextToADestroyedCommit",
     [](World& w) {
       w.spareCommit = kiv::Commit::create(w.repositories);
       w.destroyInTransaction(w.spareCommit);
     },
     [](World& w) { w.clone.workspace->setContext(w.spareCommit, Mode::ContextOnly); }, Raises::Library,
     message<qf0::messages::CannotAddNonExistentObject>()},
    {"SetContextToACommitOfAnotherModel", [](World& w) { w.spareCommit = kiv::Commit::create(w.elsewhere); },
     [](World& w) { w.clone.workspace->setContext(w.spareCommit, Mode::BranchUpdate); }, Raises::Library,
     message<qf0::messages::CannotCreateCrossModelAssociation>()},
    {"UpdateWithADestroyedDelta",
     [](World& w) {
       w.spareDelta = w.c4->getDelta()->invert();
       w.destroyInTransaction(w.spareDelta);
     },
     [](World& w) { w.clone.workspace->update(w.spareDelta); }, Raises::Library,
     message<qf0::messages::ElementRequired>(std::u16string(u"kiv.Workspace.update"))},
    {"LoadContextOfADestroyedWorkspace", [](World& w) { w.destroyInTransaction(w.clone.workspace); },
     [](World& w) { kiv::loadContext(w.clone.workspace); }, Raises::Library,
     message<qf0::messages::ElementRequired>(std::u16string(u"kiv.loadContext"))},
    {"UndoOnADestroyedWorkspace", [](World& w) { w.destroyInTransaction(w.clone.workspace); },
     [](World& w) { w.clone.workspace->undo(); }, Raises::Library, message<kiv::messages::CannotCommit>()},
    {"GetWorkspaceOfNoModel", nothing, [](World& w) { w.clone.repository->getWorkspace(Model()); },
     Raises::Library,
     message<qf0::messages::ElementRequired>(std::u16string(u"kiv.LocalRepository.getWorkspace"))},
    {"CommitTransactionWhoseEditFails", nothing,
     [](World& w) {
       w.clone.workspace->commitTransaction([&] {
         w.tm.setName(w.a, u"half");
         throw Injected();
       });
     },
     Raises::Injected},
    {"CommitTransactionOfAnEmptyFunction", nothing,
     [](World& w) { w.clone.workspace->commitTransaction(std::function<void()>()); }, Raises::BadCall},
    {"CommitTransactionOfAnEmptyHostCallback", nothing,
     [](World& w) { w.clone.workspace->commitTransaction(qf::zero::HxArray()); }, Raises::BadCall},
};

class RefusedCalls : public ::testing::TestWithParam<RefusedCall> {};

TEST_P(RefusedCalls, RaiseTheirErrorAndChangeNothing) {
  const RefusedCall& call = GetParam();
  World world;
  call.prepare(world);
  const Dumps before = world.dumps();
  try {
    call.run(world);
    ADD_FAILURE() << "nothing was raised";
  } catch (const Injected&) {
    EXPECT_EQ(call.raises, Raises::Injected);
  } catch (const std::bad_function_call&) {
    EXPECT_EQ(call.raises, Raises::BadCall);
  } catch (const foundation::core::except::ExceptionBase& e) {
    EXPECT_EQ(call.raises, Raises::Library) << e.message();
    if (call.message) {
      EXPECT_EQ(e.GetBaseMsgIDObj().render(), call.message().render());
    }
  }
  const Dumps after = world.dumps();
  EXPECT_EQ(after.repositories, before.repositories) << "the repository model changed";
  EXPECT_EQ(after.user, before.user) << "the user model changed";
  if (after == before) world.expectStillProducing();
}

INSTANTIATE_TEST_SUITE_P(Calls, RefusedCalls, ::testing::ValuesIn(refusedCalls), RowName());

}  // namespace
}  // namespace workspace_test
