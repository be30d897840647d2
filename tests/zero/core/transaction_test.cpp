// Exact rollback and change reports of transactions on a run-time metamodel.
#include "qf/zero/core/builder.h"
#include "qf/zero/core/meta/meta_registry.h"
#include "qf/zero/core/model_impl.h"
#include "qf/zero/core/reference_collection.h"

#include <gtest/gtest.h>

#include <tuple>
#include <utility>

namespace qf::zero {
namespace {

// A library: shelves contain books; a book may cite other books and has a title.
struct Library {
  Model metaModel = Model::create();
  meta::Class shelf, book;
  meta::Property shelfBooks, title, cites;

  Library() {
    auto& registry = meta::MetaRegistry::getInstance();
    shelf = meta::Class::create(metaModel, {}, u"Shelf", u"test.Shelf", false);
    book = meta::Class::create(metaModel, {}, u"Book", u"test.Book", false);
    shelf->setSuperclass(ModelElement::metaClass());
    book->setSuperclass(ModelElement::metaClass());
    shelfBooks = meta::Property::create(metaModel, {}, u"books", meta::ValueFlags::Sequence, true);
    shelfBooks->setType(book);
    shelfBooks->setPropertyIndex(1);
    shelfBooks->setIsUnique(true);
    shelf->addProperty(shelfBooks);
    title = meta::Property::create(metaModel, {}, u"title", meta::ValueFlags::Single, false);
    title->setType(registry.getPrimitiveType(u"String"));
    title->setPropertyIndex(1);
    book->addProperty(title);
    cites = meta::Property::create(metaModel, {}, u"cites", meta::ValueFlags::Set, false);
    cites->setType(book);
    cites->setPropertyIndex(2);
    book->addProperty(cites);
  }
};

std::u16string titleOf(const Library& l, const ModelElement& e) {
  return e.getPropertyValue(l.title).getValue<std::u16string>();
}

ReferenceCollection* books(const Library& l, const ModelElement& shelf) {
  return shelf.getPropertyValue(l.shelfBooks).getValue<ReferenceCollection*>();
}

// A shelf holding one book titled "Dune".
std::pair<ModelElement, ModelElement> shelvedDune(const Library& l, const Model& model) {
  ModelElement shelf = l.shelf.instantiate(model);
  ModelElement dune = l.book.instantiate(model);
  books(l, shelf)->add(dune);
  dune.setPropertyValue(l.title, Value::of(std::u16string(u"Dune")));
  return {shelf, dune};
}

TEST(Transaction, CancelRestoresCreatedChangedAndDestroyedElements) {
  Library l;
  Model model = Model::create();
  ModelElement shelf, dune;
  std::tie(shelf, dune) = shelvedDune(l, model);
  ASSERT_EQ(dune.container(), shelf);
  {
    Transaction t = model->beginTransaction();
    ModelElement other = l.book.instantiate(model);
    other.getPropertyValue(l.cites).getValue<ReferenceCollection*>()->add(dune);
    dune.setPropertyValue(l.title, Value::of(std::u16string(u"Changed")));
    shelf.destroy();
    EXPECT_FALSE(dune.isLive());
    EXPECT_EQ(model->getTopLevelElements().size(), 1u);
  }
  EXPECT_TRUE(shelf.isLive());
  EXPECT_TRUE(dune.isLive());
  EXPECT_EQ(dune.container(), shelf);
  EXPECT_EQ(titleOf(l, dune), u"Dune");
  EXPECT_EQ(model->getElementCount(), 2u);
  EXPECT_TRUE(dune->incomingReferences().empty());
}

// Where a transaction destroys an element and then makes a new one with its UUID: the
// cancel of the whole must bring back the old element, found by its UUID, and nothing else.
enum class Reuse {
  SameLevel,                      // both in the outermost transaction, which is cancelled
  RecreatedInSavepoint,           // destroyed outside, re-created in a committed savepoint
  DestroyedInCommittedSavepoint,  // destroyed in a committed savepoint, re-created outside
  BothInCancelledSavepoint        // both in a savepoint, and only the savepoint is cancelled
};

class DestroyThenRecreate : public ::testing::TestWithParam<Reuse> {};

TEST_P(DestroyThenRecreate, CancelBringsBackTheOldElementUnderItsUuid) {
  Library l;
  Model model = Model::create();
  ModelElement shelf, dune;
  std::tie(shelf, dune) = shelvedDune(l, model);
  const Uuid id = dune.getUuid();
  const Reuse reuse = GetParam();
  const auto recreate = [&] {
    ModelElement again = l.book.instantiate(model, id);
    books(l, shelf)->add(again);
    ASSERT_EQ(model->findElement(id), again);
  };
  {
    Transaction outer = model->beginTransaction();
    {
      Transaction inner = model->beginTransaction();
      dune.destroy();
      if (reuse == Reuse::SameLevel || reuse == Reuse::RecreatedInSavepoint) inner.commit();
      if (reuse == Reuse::DestroyedInCommittedSavepoint) {
        inner.commit();
        recreate();
      } else if (reuse == Reuse::RecreatedInSavepoint) {
        Transaction another = model->beginTransaction();
        recreate();
        another.commit();
      } else {
        recreate();
      }
    }
    if (reuse == Reuse::BothInCancelledSavepoint) outer.commit();
  }
  EXPECT_EQ(model->getElementCount(), 2u);
  EXPECT_EQ(model->findElement(id), dune);
  EXPECT_TRUE(dune.isLive());
  EXPECT_EQ(books(l, shelf)->getAllValues(), std::vector<ModelElement>{dune});
  EXPECT_EQ(titleOf(l, dune), u"Dune");
}

INSTANTIATE_TEST_SUITE_P(Levels, DestroyThenRecreate,
                         ::testing::Values(Reuse::SameLevel, Reuse::RecreatedInSavepoint,
                                           Reuse::DestroyedInCommittedSavepoint,
                                           Reuse::BothInCancelledSavepoint));

TEST(Transaction, InnerSavepointCancelKeepsOuterChanges) {
  Library l;
  Model model = Model::create();
  ModelElement dune = l.book.instantiate(model);
  Transaction outer = model->beginTransaction();
  dune.setPropertyValue(l.title, Value::of(std::u16string(u"Outer")));
  {
    Transaction inner = model->beginTransaction();
    dune.setPropertyValue(l.title, Value::of(std::u16string(u"Inner")));
  }
  EXPECT_EQ(titleOf(l, dune), u"Outer");
  outer.commit();
  EXPECT_EQ(titleOf(l, dune), u"Outer");
}

struct Recorder : Listener {
  std::shared_ptr<ShallowChangeReport<ModelElement>> last;
  void transactionCommitted(const std::shared_ptr<ShallowChangeReport<ModelElement>>& report) {
    last = report;
  }
};

TEST(ChangeReport, ChangedBackIsNoChange) {
  Library l;
  Model model = Model::create();
  ModelElement dune = l.book.instantiate(model);
  Recorder recorder;
  model->addShallowListener(&recorder);
  {
    Transaction t = model->beginTransaction();
    dune.setPropertyValue(l.title, Value::of(std::u16string(u"X")));
    dune.setPropertyValue(l.title, Value::of(std::u16string(u"")));
    t.commit();
  }
  ASSERT_TRUE(recorder.last);
  EXPECT_TRUE(recorder.last->isEmpty());
  {
    Transaction t = model->beginTransaction();
    dune.setPropertyValue(l.title, Value::of(std::u16string(u"Y")));
    t.commit();
  }
  ASSERT_EQ(recorder.last->getModified().size(), 1u);
  EXPECT_EQ(recorder.last->getOldValue(dune, l.title).getValue<std::u16string>(), u"");
  model->removeListener(&recorder);
}

}  // namespace
}  // namespace qf::zero
