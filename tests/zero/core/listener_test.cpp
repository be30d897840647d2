// The commit algorithm as listeners see it, and the contents of change reports.
#include "qf/zero/core/messages.h"
#include "support/test_metamodel.h"

#include <gtest/gtest.h>

#include <stdexcept>
#include <thread>

namespace qf::zero {
namespace {

using Report = std::shared_ptr<ShallowChangeReport<ModelElement>>;

struct Journal : Listener {
  std::vector<std::string> calls;
  std::function<void(const Report&)> onValidate, onModify, onCommitted;
  Report committed, canceled;
  bool vetoed = false;

  void validateOnCommit(const Report& r) {
    calls.push_back("validate");
    if (onValidate) onValidate(r);
  }
  void modifyOnCommit(const Report& r) {
    calls.push_back("modify");
    if (onModify) onModify(r);
  }
  void transactionCommitted(const Report& r) {
    calls.push_back("committed");
    committed = r;
    if (onCommitted) onCommitted(r);
  }
  void transactionCanceled(bool v, const Report& r) {
    calls.push_back("canceled");
    vetoed = v;
    canceled = r;
  }
};

class Listeners : public ::testing::Test {
 protected:
  void SetUp() override { model->addShallowListener(&journal); }
  void TearDown() override { model->removeListener(&journal); }
  ModelElement make() { return tm.node.instantiate(model); }

  support::TestMetamodel tm;
  Model model = Model::create();
  Journal journal;
};

TEST_F(Listeners, CallbacksRunInCommitOrderOnlyForTheOutermostTransaction) {
  Transaction outer = model->beginTransaction();
  make();
  {
    Transaction inner = model->beginTransaction();
    make();
    inner.commit();
  }
  EXPECT_TRUE(journal.calls.empty());
  outer.commit();
  EXPECT_EQ(journal.calls, (std::vector<std::string>{"validate", "modify", "committed"}));
  EXPECT_EQ(journal.committed->getAdded().size(), 2u);
}

TEST_F(Listeners, AVetoCancelsEverythingAndReachesTheCommitter) {
  ModelElement kept = make();
  journal.calls.clear();
  journal.onValidate = [](const Report&) { throw std::runtime_error("no"); };
  const std::string before = support::dumpModel(model);
  Transaction t = model->beginTransaction();
  make();
  tm.setName(kept, u"renamed");
  EXPECT_THROW(t.commit(), std::runtime_error);
  EXPECT_FALSE(t.isOpen());
  EXPECT_EQ(before, support::dumpModel(model));
  EXPECT_EQ(journal.calls, (std::vector<std::string>{"validate", "canceled"}));
  EXPECT_TRUE(journal.vetoed);
  EXPECT_FALSE(model->isInTransaction());
}

TEST_F(Listeners, ModifyOnCommitChangesJoinTheReport) {
  ModelElement a = make();
  journal.onModify = [&](const Report& r) {
    if (!r->getModified().empty()) a.setPropertyValue(tm.count, Value::of(99));
  };
  tm.setName(a, u"x");
  EXPECT_TRUE(journal.committed->isChanged(a, tm.count));
  EXPECT_EQ(journal.committed->getOldValue(a, tm.count).getValue<int>(), 7);
  EXPECT_EQ(a.getPropertyValue(tm.count).getValue<int>(), 99);
}

TEST_F(Listeners, CommittedRunsAfterCloseSoListenersMayBeginTransactionsAnywhere) {
  ModelElement a = make();
  int reentered = 0;
  journal.onCommitted = [&](const Report& r) {
    if (r->getModified().empty() || reentered++ > 0) return;
    EXPECT_FALSE(model->isInTransaction());
    std::thread worker([&] { a.setPropertyValue(tm.count, Value::of(1)); });  // same model, other thread
    worker.join();
  };
  tm.setName(a, u"x");
  EXPECT_EQ(a.getPropertyValue(tm.count).getValue<int>(), 1);
  EXPECT_EQ(journal.committed->getModified().size(), 1u);
  EXPECT_TRUE(journal.committed->isChanged(a, tm.count));
}

TEST_F(Listeners, ADetachedListenerMissesTheRestOfTheTransaction) {
  Journal second;
  ListenerHolderBase* holder = model->addShallowListener(&second);
  journal.onValidate = [&](const Report&) { model->removeListenerFromTransaction(holder); };
  make();
  EXPECT_TRUE(second.calls.empty());
  journal.onValidate = nullptr;
  make();
  EXPECT_EQ(second.calls.size(), 3u);
  model->removeListener(&second);
}

struct RemovalCounter : Journal {
  int removals = 0;
  void listenerRemoved() override { ++removals; }
};

TEST_F(Listeners, RemovalIsAnnouncedOnceAndMayHappenFromACallback) {
  RemovalCounter self;
  model->addShallowListener(&self);
  self.onCommitted = [&](const Report&) { model->removeListener(&self); };
  make();
  EXPECT_EQ(self.removals, 1);
  EXPECT_EQ(self.calls.size(), 3u);
  make();
  EXPECT_EQ(self.calls.size(), 3u) << "a removed listener must not hear of later commits";
  model->removeListener(&self);
  EXPECT_EQ(self.removals, 1) << "removing an absent listener announces nothing";

  RemovalCounter survivor;
  {
    Model shortLived = Model::create();
    shortLived->addDeepListener(&survivor);
  }
  EXPECT_EQ(survivor.removals, 1) << "a model going away releases its listeners";
}

TEST_F(Listeners, ReportsListElementsInFirstChangeOrderWithOldValues) {
  ModelElement a = make(), b = make(), c = make(), gone = make();
  tm.refs(a, tm.children)->add(c);
  tm.setName(gone, u"gone");
  Transaction t = model->beginTransaction();
  tm.setName(b, u"b");
  ModelElement fresh = make();
  tm.setName(a, u"a");
  gone.destroy();
  ModelElement ephemeral = make();
  ephemeral.destroy();
  tm.refs(b, tm.friends)->add(a);
  tm.setName(c, u"c");
  tm.setName(c, u"");  // back to where it was
  t.commit();
  const Report& r = journal.committed;
  EXPECT_EQ(r->getModified(), (std::vector<ModelElement>{b, a}));
  EXPECT_EQ(r->getAdded(), (std::vector<ModelElement>{fresh}));
  EXPECT_EQ(r->getDestroyed(), (std::vector<ModelElement>{gone}));
  EXPECT_FALSE(r->isModified(c));
  EXPECT_EQ(r->getOldValue(b, tm.name).getValue<std::u16string>(), u"");
  EXPECT_EQ(r->getOldValue(gone, tm.name).getValue<std::u16string>(), u"gone");
  EXPECT_EQ(r->getOldValue(b, tm.friends).getList().size(), 0u);
  EXPECT_TRUE(r->isChanged(b, tm.friends));
  EXPECT_FALSE(r->isChanged(b, tm.count));
  EXPECT_EQ(r->getOldValue(b, tm.count).getValue<int>(), 7);
}

TEST_F(Listeners, DeepReportsNameTheContainersOfChangedElements) {
  struct Deep : Listener {
    std::shared_ptr<DeepChangeReport<ModelElement>> last;
    void transactionCommitted(const std::shared_ptr<DeepChangeReport<ModelElement>>& r) { last = r; }
  } deep;
  ModelElement root = make(), mid = make(), leaf = make();
  tm.refs(root, tm.children)->add(mid);
  tm.refs(mid, tm.children)->add(leaf);
  model->addDeepListener(&deep);
  tm.setName(leaf, u"x");
  EXPECT_EQ(deep.last->getModified(), (std::vector<ModelElement>{leaf}));
  EXPECT_EQ(deep.last->getAffectedContainers(), (std::vector<ModelElement>{mid, root}));
  model->removeListener(&deep);
}

TEST_F(Listeners, CancelTellsObserversWhatWasUndone) {
  {
    Transaction t = model->beginTransaction();
    make();
  }
  EXPECT_EQ(journal.calls, (std::vector<std::string>{"canceled"}));
  EXPECT_FALSE(journal.vetoed);
  EXPECT_EQ(journal.canceled->getAdded().size(), 1u);
}

TEST(TransactionEnds, MisuseIsRefusedClearly) {
  support::TestMetamodel tm;
  Model model = Model::create();
  Transaction outer = model->beginTransaction();
  Transaction inner = model->beginTransaction();
  EXPECT_THROW(outer.commit(), foundation::core::except::Exception<qf0::messages::TransactionNotOpen>);
  inner.commit();
  EXPECT_THROW(inner.commit(), foundation::core::except::Exception<qf0::messages::TransactionNotOpen>);
  Transaction moved = std::move(outer);
  EXPECT_FALSE(outer.isOpen());
  EXPECT_TRUE(moved.isOutermost());
  moved.commit();
  EXPECT_FALSE(model->isInTransaction());
}

}  // namespace
}  // namespace qf::zero

namespace qf::zero {
namespace {

// A prepared transaction has passed its validation: committing it without further change
// runs no validator again; a change after the prepare is validated at the commit; a veto
// in the prepare cancels and closes the transaction.
TEST_F(Listeners, APreparedTransactionCommitsWithoutASecondValidation) {
  struct Row {
    const char* name;
    bool changeAfterPrepare;
    bool vetoInPrepare;
  };
  for (const Row& row :
       {Row{"prepared", false, false}, Row{"changed after", true, false}, Row{"vetoed", false, true}}) {
    SCOPED_TRACE(row.name);
    journal.calls.clear();
    journal.onValidate = nullptr;
    if (row.vetoInPrepare) journal.onValidate = [](const Report&) { throw std::runtime_error("no"); };
    const std::string before = support::dumpModel(model);
    Transaction transaction = model->beginTransaction();
    make();
    if (row.vetoInPrepare) {
      EXPECT_THROW(transaction.prepare(), std::runtime_error);
      EXPECT_FALSE(transaction.isOpen());
      EXPECT_EQ(support::dumpModel(model), before);
      EXPECT_EQ(journal.calls, (std::vector<std::string>{"validate", "canceled"}));
      continue;
    }
    transaction.prepare();
    EXPECT_TRUE(transaction.isOpen());
    if (row.changeAfterPrepare) make();
    transaction.commit();
    const std::vector<std::string> once{"validate", "modify", "committed"};
    const std::vector<std::string> twice{"validate", "modify", "validate", "modify", "committed"};
    EXPECT_EQ(journal.calls, row.changeAfterPrepare ? twice : once);
    EXPECT_EQ(journal.committed->getAdded().size(), row.changeAfterPrepare ? 2u : 1u);
  }
}

}  // namespace
}  // namespace qf::zero
