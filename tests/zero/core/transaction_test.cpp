// Exact rollback and change reports of transactions on a run-time metamodel.
#include "qf/zero/core/builder.h"
#include "qf/zero/core/meta/meta_registry.h"
#include "qf/zero/core/model_impl.h"
#include "qf/zero/core/reference_collection.h"

#include <gtest/gtest.h>

#include <string>
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

// Whether cancelling counts as a change to watched elements, which tells the caches derived
// from them to start again. Undoing a change to an element that existed before counts; an
// element made in the cancelled level only vanishes, and must not cost the caches.
enum class Cancelled {
  Made,
  Changed,
  MadeInSavepoint,
  ChangedInSavepoint,
  MadeAndCited,
  MadeForProxy,
  ProxiedAfter
};

struct WatchedCancel {
  Cancelled what;
  bool counts;
};

std::string nameOfCancel(const ::testing::TestParamInfo<WatchedCancel>& info) {
  static const char* const names[] = {"Made",         "Changed",      "MadeInSavepoint", "ChangedInSavepoint",
                                      "MadeAndCited", "MadeForProxy", "ProxiedAfter"};
  return names[static_cast<int>(info.param.what)];
}

class CancelOfWatched : public ::testing::TestWithParam<WatchedCancel> {};

TEST_P(CancelOfWatched, CountsOnlyWhatExistedBefore) {
  Library l;
  Model model = Model::create();
  ModelElement older = l.book.instantiate(model);
  const Cancelled what = GetParam().what;
  // Changes `existing` (or makes a book) and watches what it touched; the count after.
  const auto changeAndWatch = [&](ModelElement existing) {
    switch (what) {
      case Cancelled::Made:
      case Cancelled::MadeInSavepoint: {
        ModelElement made = l.book.instantiate(model);
        made.setPropertyValue(l.title, Value::of(std::u16string(u"new")));
        made->setWatched(true);
        break;
      }
      case Cancelled::Changed:
      case Cancelled::ChangedInSavepoint:
        existing.setPropertyValue(l.title, Value::of(std::u16string(u"changed")));
        existing->setWatched(true);
        break;
      case Cancelled::MadeAndCited: {
        existing->setWatched(true);
        const ModelElement cited = l.book.instantiate(model);
        cited->setWatched(true);
        existing.getPropertyValue(l.cites).getValue<ReferenceCollection*>()->add(cited);
        break;
      }
      // A proxy, named before or after the element came, resolves to it: what was derived
      // through the proxy goes stale when the element goes.
      case Cancelled::MadeForProxy:
      case Cancelled::ProxiedAfter: {
        const Uuid id = generateNewUuid();
        const auto proxy = [&] {
          return ModelElement::Impl::createProxy(model.getImpl(), l.book, ProxyId{id, {}});
        };
        if (what == Cancelled::MadeForProxy) proxy();
        ModelElement made = l.book.instantiate(model, id);
        made->setWatched(true);
        if (what == Cancelled::ProxiedAfter) proxy();
        break;
      }
    }
    return model->getWatchedChangeCount();
  };
  std::uint64_t before = 0;
  Transaction outer = model->beginTransaction();
  if (what == Cancelled::MadeInSavepoint || what == Cancelled::ChangedInSavepoint) {
    ModelElement madeInOuterLevel = l.book.instantiate(model);
    Transaction savepoint = model->beginTransaction();
    before = changeAndWatch(madeInOuterLevel);
    savepoint.cancel();
  } else {
    before = changeAndWatch(older);
    outer.cancel();
  }
  EXPECT_EQ(model->getWatchedChangeCount() != before, GetParam().counts);
}

INSTANTIATE_TEST_SUITE_P(Levels, CancelOfWatched,
                         ::testing::Values(WatchedCancel{Cancelled::Made, false},
                                           WatchedCancel{Cancelled::Changed, true},
                                           WatchedCancel{Cancelled::MadeInSavepoint, false},
                                           WatchedCancel{Cancelled::ChangedInSavepoint, true},
                                           WatchedCancel{Cancelled::MadeAndCited, true},
                                           WatchedCancel{Cancelled::MadeForProxy, true},
                                           WatchedCancel{Cancelled::ProxiedAfter, true}),
                         nameOfCancel);

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
