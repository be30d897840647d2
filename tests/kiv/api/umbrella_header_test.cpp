// The umbrella header stands alone, and the example it opens with does what it says.
#include "kiv/kiv.h"
#include "support/test_metamodel.h"

#include <gtest/gtest.h>

#include <memory>

namespace {

void apply(const kiv::Delta& delta, const qf::zero::Model& user) {
  qf::zero::io::JSONChangeReportSynchronizer::applyChangeReportVerbatim(
      delta->toChangeReport(), user, std::make_unique<kiv::ElementReuseModelBuilder>());
}

TEST(UmbrellaHeader, OpeningExampleRecordsUndoesAndRedoes) {
  kiv::MetaPackageKiv::getInstance();
  const support::TestMetamodel meta;
  const qf::zero::Model user = qf::zero::Model::create();
  qf::zero::ModelElement book;
  {
    qf::zero::Transaction edit = user->beginTransaction();
    book = meta.node.instantiate(user);
    meta.setName(book, u"Dune");
    edit.commit();
  }
  const qf::zero::Uuid bookId = book.getUuid();

  qf::zero::Model history = qf::zero::Model::create();
  qf::zero::Transaction transaction = history->beginTransaction();
  kiv::Commit first = kiv::Commit::create(history);
  first->addCreated(book);
  kiv::Branch master = kiv::Branch::create(history);
  master->setName(u"master");
  master->commit(first);
  transaction.commit();

  apply(master->undo(), user);
  EXPECT_FALSE(user->findElement(bookId));
  EXPECT_EQ(master.getTip(), kiv::Commit());

  apply(master->redo(), user);
  const qf::zero::ModelElement again = user->findElement(bookId);
  ASSERT_TRUE(again);
  EXPECT_EQ(again.getPropertyValue(meta.name).getValue<std::u16string>(), u"Dune");
  EXPECT_EQ(master.getTip(), first);
}

}  // namespace
