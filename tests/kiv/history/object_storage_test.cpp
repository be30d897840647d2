// Object storages: the stored state of one user element, how two of them compare, and
// how a stored state is turned back into a live element.
#include "history_fixture.h"
#include "qf/zero/core/json_text.h"
#include "qf/zero/io/json_serializer.h"

#include <boost/date_time/gregorian/gregorian.hpp>
#include <boost/optional.hpp>
#include <boost/optional/optional_io.hpp>
#include <boost/uuid/uuid_io.hpp>

#include <random>
#include <set>

namespace {

using namespace history_test;
using qf::zero::Value;

using ObjectStorages = HistoryTest;

JsonValue fullEntryOf(const ModelElement& element) {
  qf::zero::io::JSONSerializer serializer;
  serializer.getCustomizer().setShouldSkipDefaultValues(false);
  return serializer.writeEntry(element);
}

TEST_F(ObjectStorages, IsEmptyUnlessItNamesAnElement) {
  EXPECT_TRUE(kiv::ObjectStorage::create(repository).isEmpty()) << "no element UUID";
  EXPECT_TRUE(kiv::ObjectStorage::Builder(repository).doSetElementUUID(Uuid()).create().isEmpty())
      << "nil UUID";
  EXPECT_FALSE(kiv::ObjectStorage::Builder(repository)
                   .doSetElementUUID(qf::zero::generateNewUuid())
                   .create()
                   .isEmpty());
  EXPECT_FALSE(kiv::ObjectStorage::create(repository).setContent(gadgetNamed(u"g")).isEmpty());
}

TEST_F(ObjectStorages, SetContentStoresTheWholeEntryDefaultsIncluded) {
  const ModelElement gadget = gadgetNamed(u"g");
  const kiv::ObjectStorage storage = kiv::ObjectStorage::create(repository);
  EXPECT_EQ(storage.setContent(gadget), storage);
  EXPECT_EQ(storage.getElementUUID(), gadget.getUuid());
  EXPECT_EQ(storage.getContent(), fullEntryOf(gadget));
  const JsonValue content = storage.getContent().at("content");
  EXPECT_EQ(content.at("count"), 7) << "a default value is written too";
  EXPECT_EQ(content.at("flag"), true);
  EXPECT_EQ(content.at("tags"), JsonValue::array());
  EXPECT_EQ(content.at("children"), JsonValue::array());

  // Storing another element re-keys the storage, also in a map that holds it.
  const ModelElement other = gadgetNamed(u"h");
  kiv::Delta delta = kiv::Delta::create(repository);
  delta.addCreated(storage);
  storage.setContent(other);
  EXPECT_EQ(storage.getElementUUID(), other.getUuid());
  EXPECT_EQ(storage.getContent(), fullEntryOf(other));
  EXPECT_EQ(delta.getCurrent(other.getUuid()), storage);
  EXPECT_FALSE(delta.getCurrent(gadget.getUuid()));
}

TEST_F(ObjectStorages, SetContentOfNoElementRaisesAndChangesNothing) {
  const ModelElement gadget = gadgetNamed(u"g");
  const kiv::ObjectStorage storage = kiv::ObjectStorage::create(repository).setContent(gadget);
  const std::string before = support::dumpModel(repository);
  EXPECT_THROW(storage.setContent(ModelElement()), Exception<qf0::messages::ElementRequired>);
  ModelElement gone = gadgetNamed(u"gone");
  gone.destroy();
  EXPECT_THROW(storage.setContent(gone), Exception<qf0::messages::ElementRequired>);
  // Content is held as text: a string that is not UTF-8 has none.
  EXPECT_THROW(storage->setContent(JsonValue{{"name", std::string("\xff")}}),
               Exception<qf0::messages::InvalidValue>);
  ModelElement odd = gadgetNamed(u"odd");
  odd.setPropertyValue(tm.note, qf::zero::Value::of(JsonValue{{"bytes", std::string("\xc3")}}));
  EXPECT_THROW(storage.setContent(odd), Exception<qf0::messages::InvalidValue>);
  EXPECT_EQ(support::dumpModel(repository), before);
  EXPECT_EQ(storage.getContent(), fullEntryOf(gadget));
}

TEST_F(ObjectStorages, InstantiateCreatesTheStoredElementUnderItsUuid) {
  ModelElement gadget = gadgetNamed(u"g");
  gadget.setPropertyValue(tm.count, Value::of(3));
  gadget.setPropertyValue(tm.spot, Value::of(support::Point{1, -2}));
  gadget.setPropertyValue(tm.note, Value::of(JsonValue{{"n", 1}}));
  gadget.setPropertyValue(tm.born, Value::of(qf::zero::DateTime(boost::gregorian::date(2021, 3, 4))));
  tm.values(gadget, tm.tags)->genericAdd(Value::of(std::u16string(u"t")));
  tm.values(gadget, tm.scores)->genericAdd(Value::of(5));
  tm.values(gadget, tm.scores)->genericAdd(Value::of(5));
  const kiv::ObjectStorage storage = kiv::ObjectStorage::create(repository).setContent(gadget);

  const Model fresh = Model::create();
  const ModelElement made = storage.instantiate(fresh);
  ASSERT_TRUE(made);
  EXPECT_EQ(made.getUuid(), gadget.getUuid());
  EXPECT_EQ(made.getModel(), fresh);
  EXPECT_EQ(support::dumpModel(fresh, /*includeTransient=*/false), support::dumpModel(user, false));
}

// Replaying a stored state onto the element it came from resets every property, each
// many-valued one replaced rather than merged, and keeps both ends of references in step.
TEST_F(ObjectStorages, InstantiateRefreshesAnExistingElementInPlace) {
  ModelElement gadget = gadgetNamed(u"g");
  const ModelElement child = gadgetNamed(u"child");
  const ModelElement loose = gadgetNamed(u"loose");
  const ModelElement oldFriend = gadgetNamed(u"old friend");
  const ModelElement newFriend = gadgetNamed(u"new friend");
  tm.refs(gadget, tm.children)->add(child);
  tm.refs(gadget, tm.friends)->add(oldFriend);
  tm.values(gadget, tm.tags)->genericAdd(Value::of(std::u16string(u"kept")));
  tm.values(gadget, tm.scores)->genericAdd(Value::of(1));
  tm.values(gadget, tm.scores)->genericAdd(Value::of(2));
  gadget.setPropertyValue(tm.best, Value::createElementValue(oldFriend));
  const kiv::ObjectStorage storage = kiv::ObjectStorage::create(repository).setContent(gadget);
  const std::string stored = support::dumpModel(user, /*includeTransient=*/false);

  {
    qf::zero::Transaction transaction = user->beginTransaction();
    tm.setName(gadget, u"renamed");
    gadget.setPropertyValue(tm.count, Value::of(0));
    gadget.setPropertyValue(tm.flag, Value::of(false));
    gadget.setPropertyValue(tm.kind, Value::createElementValue(tm.kindEnum->getLiterals()[1]));
    gadget.setPropertyValue(tm.spot, Value::of(support::Point{4, 4}));
    gadget.setPropertyValue(tm.note, Value::of(JsonValue::array({1, 2})));
    gadget.setPropertyValue(tm.best, Value::createElementValue(newFriend));
    tm.values(gadget, tm.tags)->genericAdd(Value::of(std::u16string(u"added")));
    tm.values(gadget, tm.scores)->genericAdd(Value::of(3));
    tm.refs(gadget, tm.friends)->remove(oldFriend);
    tm.refs(gadget, tm.friends)->add(newFriend);
    tm.refs(gadget, tm.children)->add(loose);
    transaction.commit();
  }
  const std::size_t count = user->getElementCount();

  EXPECT_EQ(storage.instantiate(user), gadget) << "the element is refreshed, not made anew";
  EXPECT_EQ(user->getElementCount(), count);
  EXPECT_EQ(support::dumpModel(user, false), stored);
  EXPECT_TRUE(tm.refs(oldFriend, tm.friends)->contains(gadget));
  EXPECT_FALSE(tm.refs(newFriend, tm.friends)->contains(gadget));
}

// Rows compare the storage `mine` (element E, content C) with another storage.
struct EqualityCase {
  const char* name;
  bool expected;
  kiv::ObjectStorage (*other)(const kiv::ObjectStorage& mine, const Model& elsewhere);
};

kiv::ObjectStorage twin(const kiv::ObjectStorage& mine, const Model& elsewhere,
                        const boost::optional<Uuid>& element, const JsonValue& content) {
  return kiv::ObjectStorage::Builder(elsewhere).doSetElementUUID(element).doSetContent(content).create(
      mine.getUuid());
}

const JsonValue kContent = {{"type", "tm.Node"}, {"id", "e"}, {"content", {{"name", "Zoë"}, {"count", 7}}}};

const EqualityCase kEqualityCases[] = {
    {"Itself", true, [](const kiv::ObjectStorage& mine, const Model&) { return mine; }},
    {"NoStorage", false, [](const kiv::ObjectStorage&, const Model&) { return kiv::ObjectStorage(); }},
    {"TwinElsewhere", true,
     [](const kiv::ObjectStorage& mine, const Model& elsewhere) {
       return twin(mine, elsewhere, mine.getElementUUID(), kContent);
     }},
    {"DestroyedTwin", false,
     [](const kiv::ObjectStorage& mine, const Model& elsewhere) {
       kiv::ObjectStorage gone = twin(mine, elsewhere, mine.getElementUUID(), kContent);
       gone.destroy();
       return gone;
     }},
    {"OwnUuidDiffers", false,
     [](const kiv::ObjectStorage& mine, const Model&) {
       return kiv::ObjectStorage::Builder(mine.getModel())
           .doSetElementUUID(mine.getElementUUID())
           .doSetContent(mine.getContent())
           .create();
     }},
    {"ElementDiffers", false,
     [](const kiv::ObjectStorage& mine, const Model& elsewhere) {
       return twin(mine, elsewhere, qf::zero::generateNewUuid(), kContent);
     }},
    {"ElementMissing", false,
     [](const kiv::ObjectStorage& mine, const Model& elsewhere) {
       return twin(mine, elsewhere, boost::none, kContent);
     }},
    {"MembersInAnotherOrder", false,
     [](const kiv::ObjectStorage& mine, const Model& elsewhere) {
       const JsonValue reordered = {
           {"type", "tm.Node"}, {"id", "e"}, {"content", {{"count", 7}, {"name", "Zoë"}}}};
       return twin(mine, elsewhere, mine.getElementUUID(), reordered);
     }},
    {"IntegerWrittenAsFloat", false,
     [](const kiv::ObjectStorage& mine, const Model& elsewhere) {
       JsonValue content = kContent;
       content["content"]["count"] = 7.0;
       return twin(mine, elsewhere, mine.getElementUUID(), content);
     }},
};

class ObjectStorageEquality : public ::testing::TestWithParam<EqualityCase>, public HistoryModels {};

TEST_P(ObjectStorageEquality, Compares) {
  const kiv::ObjectStorage mine = kiv::ObjectStorage::Builder(repository)
                                      .doSetElementUUID(qf::zero::generateNewUuid())
                                      .doSetContent(kContent)
                                      .create();
  const kiv::ObjectStorage other = GetParam().other(mine, elsewhere);
  EXPECT_EQ(mine.isEqual(other), GetParam().expected);
  if (other && other.isLive()) {
    EXPECT_EQ(other.isEqual(mine), GetParam().expected) << "symmetric";
  }
}

INSTANTIATE_TEST_SUITE_P(, ObjectStorageEquality, ::testing::ValuesIn(kEqualityCases), CaseName());

using ObjectStorageEqualityWithoutElement = HistoryTest;

TEST_F(ObjectStorageEqualityWithoutElement, NeedsBothElementUuidsAbsent) {
  const kiv::ObjectStorage mine = kiv::ObjectStorage::Builder(repository).doSetContent(kContent).create();
  EXPECT_TRUE(mine.isEqual(twin(mine, elsewhere, boost::none, kContent)));
  const Model third = Model::create();
  EXPECT_FALSE(mine.isEqual(twin(mine, third, qf::zero::generateNewUuid(), kContent)));
}

// Storages read from a document hold the compact text of the document's own content; a
// refresh in place is recorded like any change, and a cancelled parse leaves no trace.
class ParsedStorages : public HistoryTest, public ::testing::WithParamInterface<unsigned> {
 protected:
  struct ModifiedElements : qf::zero::Listener {
    void transactionCommitted(const std::shared_ptr<qf::zero::ShallowChangeReport<ModelElement>>& report) {
      modified = report->getModified();
    }
    std::vector<ModelElement> modified;
  };

  // A document of storages with the ids `ids`, each of the element its id names by
  // name, with the contents `contents`.
  static JsonValue documentOf(const std::vector<Uuid>& ids, const std::vector<JsonValue>& contents) {
    const Model source = Model::create();
    for (std::size_t i = 0; i < ids.size(); ++i) {
      kiv::ObjectStorage::Builder(source)
          .doSetElementUUID(qf::zero::nameBasedUuid(ids[i], "element"))
          .doSetContent(contents[i])
          .create(ids[i]);
    }
    return support::serializeModel(source);
  }

  static void parse(const JsonValue& document, const Model& model, bool reusing, bool commit) {
    std::unique_ptr<qf::zero::io::ModelBuilder> builder;
    if (reusing) {
      builder = std::make_unique<qf::zero::io::ElementReusingModelBuilder>();
    } else {
      builder = std::make_unique<qf::zero::io::ModelBuilder>();
    }
    qf::zero::io::JSONParser parser(std::make_unique<qf::zero::io::ParseCustomizer>(), std::move(builder));
    qf::zero::Transaction transaction = model->beginTransaction();
    parser.parseVerbatim(document, model);
    if (commit) transaction.commit();
  }

  static std::string heldTextOf(const ModelElement& storage) {
    const ModelElement::Impl& impl = *storage.getImpl();
    return impl.basicGetHeldText(kiv::MetaPackageKiv::getInstance().getObjectStorage_content())->text();
  }
};

TEST_P(ParsedStorages, HoldTheDocumentsContentAsItsCompactText) {
  std::mt19937 random(GetParam());
  std::vector<Uuid> ids;
  std::vector<JsonValue> firsts, seconds;
  for (int i = 0; i < 30; ++i) {
    ids.push_back(qf::zero::generateNewUuid());
    firsts.push_back(support::randomJsonValue(random));
    // Every third storage is given its content again, which a refresh leaves alone.
    seconds.push_back(i % 3 == 0 ? firsts.back() : support::randomJsonValue(random));
  }
  const auto expectContents = [&](const std::vector<JsonValue>& contents, const char* when) {
    for (std::size_t i = 0; i < ids.size(); ++i) {
      const ModelElement storage = repository->findElement(ids[i]);
      ASSERT_TRUE(storage) << when;
      EXPECT_EQ(heldTextOf(storage), qf::zero::JsonText(contents[i]).text()) << when << ", storage " << i;
      EXPECT_EQ(qf::zero::elementCast<kiv::ObjectStorage>(storage).getContent(), contents[i]) << when;
    }
  };

  parse(documentOf(ids, firsts), repository, /*reusing=*/false, /*commit=*/false);
  EXPECT_EQ(repository->getElementCount(), 0U) << "a cancelled parse leaves nothing";
  parse(documentOf(ids, firsts), repository, false, true);
  expectContents(firsts, "parsed");

  const JsonValue refresh = documentOf(ids, seconds);
  parse(refresh, repository, /*reusing=*/true, /*commit=*/false);
  expectContents(firsts, "refresh cancelled");

  ModifiedElements observer;
  repository->addShallowListener(&observer);
  parse(refresh, repository, true, true);
  repository->removeListener(&observer);
  expectContents(seconds, "refreshed");
  std::set<Uuid> expected, modified;
  for (std::size_t i = 0; i < ids.size(); ++i) {
    if (qf::zero::JsonText(firsts[i]) != qf::zero::JsonText(seconds[i])) expected.insert(ids[i]);
  }
  for (const ModelElement& element : observer.modified) modified.insert(element.getUuid());
  EXPECT_EQ(modified, expected) << "exactly the storages whose content changed are modified";
}

INSTANTIATE_TEST_SUITE_P(Seeds, ParsedStorages, ::testing::Range(1U, 9U));

}  // namespace
