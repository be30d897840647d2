// Reading documents: hostile input is refused with a clear error and changes
// nothing; the customizer and builder hooks decide what is made.
#include "qf/zero/io/json_parser.h"

#include "qf/zero/io/json_serializer.h"
#include "support/json_documents.h"
#include "support/test_metamodel.h"

#include <gtest/gtest.h>

#include <functional>

namespace qf::zero::io {
namespace {

using nlohmann::ordered_json;
using support::dumpModel;

// A small model in every test: p contains c; g (a Gadget) points at p and indexes c.
class Documents : public ::testing::Test {
 public:
  void SetUp() override {
    p = tm.node.instantiate(source);
    c = tm.leaf.instantiate(source);
    g = tm.gadget.instantiate(source);
    tm.setName(p, u"p");
    tm.setName(c, u"c");
    tm.refs(p, tm.children)->add(c);
    g.setPropertyValue(tm.best, Value::createElementValue(p));
    tm.refs(g, tm.index)->add(c);
    g.setPropertyValue(tm.spot, Value::of(support::Point{3, 4}));
    document = support::serializeModel(source);
    bystander = tm.node.instantiate(target);
  }
  // The entry of an element of the source model.
  ordered_json& entry(const ModelElement& e) {
    for (auto& candidate : document["entries"]) {
      if (candidate["id"] == e.identifier()) return candidate;
    }
    throw std::logic_error("no entry");
  }
  ordered_json& content(const ModelElement& e) { return entry(e)["content"]; }

  support::TestMetamodel tm;
  Model source = Model::create();
  Model target = Model::create();
  ModelElement p, c, g, bystander;
  ordered_json document;
};

struct HostileCase {
  const char* name;
  std::function<void(Documents&)> spoil;
  const char* expectedKey;
};

class HostileDocuments : public Documents, public ::testing::WithParamInterface<HostileCase> {};

TEST_P(HostileDocuments, AreRefusedWithAClearErrorAndChangeNothing) {
  GetParam().spoil(*this);
  const std::string before = dumpModel(target);
  Transaction callers = target->beginTransaction();
  try {
    JSONParser().parseVerbatim(document, target);
    ADD_FAILURE() << "accepted";
  } catch (const foundation::core::except::ExceptionBase& error) {
    EXPECT_EQ(error.GetID(), std::string("qf0:messages/") + GetParam().expectedKey) << error.message();
  }
  EXPECT_EQ(before, dumpModel(target));
  callers.commit();  // the failed parse must not spoil the caller's transaction
  EXPECT_EQ(before, dumpModel(target));
}

const HostileCase hostileCases[] = {
    {"NotAnObject", [](Documents& d) { d.document = ordered_json::array(); }, "MalformedDocument"},
    {"NoVersion", [](Documents& d) { d.document.erase("version"); }, "MalformedDocument"},
    {"FutureVersion", [](Documents& d) { d.document["version"] = "2.0"; }, "UnsupportedFormatVersion"},
    {"EntriesNotAnArray", [](Documents& d) { d.document["entries"] = ordered_json::object(); },
     "MalformedDocument"},
    {"EntryNotAnObject", [](Documents& d) { d.document["entries"].push_back(42); }, "MalformedDocument"},
    {"ContentNotAnObject", [](Documents& d) { d.entry(d.c)["content"] = ordered_json::array(); },
     "MalformedDocument"},
    {"UnknownClass", [](Documents& d) { d.entry(d.c)["type"] = "tm.Nope"; }, "NoSuchClass"},
    {"AbstractClass", [](Documents& d) { d.entry(d.c)["type"] = "ModelElement"; },
     "CannotInstantiateAbstractClass"},
    {"IdNotAUuid", [](Documents& d) { d.entry(d.c)["id"] = "c-17"; }, "MalformedDocument"},
    {"IdTwiceInTheDocument", [](Documents& d) { d.entry(d.g)["id"] = d.c.identifier(); },
     "DuplicateElementId"},
    {"IdAlreadyInTheModel", [](Documents& d) { d.entry(d.c)["id"] = d.bystander.identifier(); },
     "DuplicateElementId"},
    {"UnknownProperty", [](Documents& d) { d.content(d.c)["colour"] = "red"; }, "NoSuchProperty"},
    {"TextForAnInteger", [](Documents& d) { d.content(d.c)["count"] = "7"; }, "WrongJsonType"},
    {"IntegerOverflow", [](Documents& d) { d.content(d.c)["count"] = 1LL << 40; }, "WrongJsonType"},
    {"FractionForAnInteger", [](Documents& d) { d.content(d.c)["count"] = 1.5; }, "WrongJsonType"},
    {"NullForASingleValue", [](Documents& d) { d.content(d.c)["name"] = nullptr; }, "WrongJsonType"},
    {"UnknownLiteral", [](Documents& d) { d.content(d.c)["kind"] = "Odd"; }, "WrongJsonType"},
    {"UnreadableDate", [](Documents& d) { d.content(d.c)["born"] = "yesterday"; }, "WrongJsonType"},
    {"ScalarForASet", [](Documents& d) { d.content(d.c)["tags"] = "a"; }, "WrongJsonType"},
    {"ScalarForADatatype", [](Documents& d) { d.content(d.g)["spot"] = 5; }, "WrongJsonType"},
    {"UnknownDatatypeMember", [](Documents& d) { d.content(d.g)["spot"]["z"] = 1; }, "NoSuchProperty"},
    {"DanglingReference", [](Documents& d) { d.content(d.g)["best"] = toText(generateNewUuid()); },
     "DanglingReference"},
    {"ReferenceNotAUuid", [](Documents& d) { d.content(d.g)["best"] = 12; }, "WrongJsonType"},
    {"ContainmentCycle",
     [](Documents& d) { d.content(d.c)["children"] = ordered_json::array({d.p.identifier()}); },
     "CannotCreateCircularContainment"},
    {"ContainedTwice",
     [](Documents& d) { d.content(d.g)["children"] = ordered_json::array({d.c.identifier()}); },
     "MalformedDocument"},
    {"MapKeyTakenTwice",
     [](Documents& d) {
       d.content(d.c)["name"] = "p";
       d.content(d.g)["index"] = ordered_json::array({d.p.identifier(), d.c.identifier()});
     },
     "UniquenessConstraint"},
};

INSTANTIATE_TEST_SUITE_P(Cases, HostileDocuments, ::testing::ValuesIn(hostileCases),
                         [](const ::testing::TestParamInfo<HostileCase>& info) { return info.param.name; });

TEST_F(Documents, ParsingKeepsIdentitiesAndReturnsTheEntriesElementsInOrder) {
  const std::vector<ParseItem> items = JSONParser().parseVerbatim(document, target);
  ASSERT_EQ(items.size(), 3u);
  EXPECT_EQ(items[0].getValue().getElement().getUuid(), p.getUuid());
  EXPECT_EQ(items[1].getValue().getElement().getUuid(), c.getUuid());
  EXPECT_EQ(items[2].getValue().getElement().getUuid(), g.getUuid());
  const ModelElement copy = items[2].getValue().getElement();
  EXPECT_EQ(copy.getPropertyValue(tm.spot).getValue<support::Point>(), (support::Point{3, 4}));
  EXPECT_EQ(copy.getPropertyValue(tm.best).getElement(), items[0].getValue().getElement());
}

TEST_F(Documents, AReusingBuilderRefreshesElementsInPlace) {
  JSONParser().parseVerbatim(document, target);
  const ModelElement firstC = target->findElement(c.getUuid());
  tm.setName(c, u"renamed");
  tm.values(c, tm.tags)->genericAdd(Value::of(std::u16string(u"t")));
  JSONParser(nullptr, std::make_unique<ElementReusingModelBuilder>())
      .parseVerbatim(support::serializeModel(source), target);
  EXPECT_EQ(target->findElement(c.getUuid()), firstC);
  EXPECT_EQ(target->getElementCount(), 4u);
  EXPECT_EQ(firstC.getPropertyValue(tm.name).getValue<std::u16string>(), u"renamed");
  EXPECT_EQ(tm.values(firstC, tm.tags)->size(), 1u);
  EXPECT_THROW(JSONParser().parseVerbatim(document, target),
               foundation::core::except::Exception<qf0::messages::DuplicateElementId>)
      << "the plain builder never reuses";
}

TEST_F(Documents, CustomizersChooseWhatIsMadeAndWhatIsRead) {
  struct OnlyNodes final : ParseCustomizer {
    explicit OnlyNodes(const support::TestMetamodel& metamodel) : tm(&metamodel) {}
    bool shallInstantiate(const meta::Class& type, const ElementId&) override { return type != tm->gadget; }
    bool shallReadProperty(const ModelElement&, const meta::Property& property) override {
      return property != tm->count;
    }
    ModelElement findReference(ModelBuilder&, const Model&, const meta::Class&,
                               const ElementId& id) override {
      asked.push_back(*id.uuid);
      return ModelElement();
    }
    void setPackageUris(const std::vector<std::string>& uris) override { packages = uris; }
    const support::TestMetamodel* tm;
    std::vector<Uuid> asked;
    std::vector<std::string> packages;
  };
  auto customizer = std::make_unique<OnlyNodes>(tm);
  OnlyNodes& hooks = *customizer;
  tm.setName(c, u"c");
  document["packages"] = ordered_json::array({"/test/tm"});
  content(p)["count"] = 99;

  JSONParser parser(std::move(customizer), nullptr);
  const std::vector<ParseItem> items = parser.parseVerbatim(document, target);
  ASSERT_EQ(items.size(), 2u) << "the gadget entry is skipped";
  EXPECT_EQ(items[0].getValue().getElement().getPropertyValue(tm.count).getValue<int>(), 7)
      << "count is not read";
  EXPECT_EQ(hooks.packages, (std::vector<std::string>{"/test/tm"}));
  EXPECT_TRUE(hooks.asked.empty()) << "no entry refers to the skipped gadget";

  content(p)["best"] = g.identifier();
  EXPECT_THROW(JSONParser(std::make_unique<OnlyNodes>(tm), nullptr).parseVerbatim(document, Model::create()),
               foundation::core::except::Exception<qf0::messages::DanglingReference>)
      << "a reference to a skipped entry resolves like one outside the document";
}

}  // namespace
}  // namespace qf::zero::io
