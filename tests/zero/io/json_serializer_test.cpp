// What the serializer writes: the document layout, the choices of its customizer,
// and values whose form a registered serializer decides.
#include "qf/zero/io/json_serializer.h"

#include "qf/zero/core/meta/builtin_property_serializers.h"
#include "qf/zero/core/meta/framework_package.h"
#include "qf/zero/io/json_constants.h"
#include "qf/zero/io/json_parser.h"
#include "support/json_documents.h"
#include "support/test_metamodel.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <limits>
#include <random>

namespace qf::zero::io {
namespace {

using nlohmann::ordered_json;

ordered_json write(JSONSerializer& serializer, const ModelElement& element) {
  ordered_json document;
  serializer.serialize(element, SerializationOutput::forIntermediateFormat(&document));
  return document;
}

std::vector<std::string> memberNames(const ordered_json& object) {
  std::vector<std::string> names;
  for (const auto& [name, value] : object.items()) names.push_back(name);
  return names;
}

class Serializer : public ::testing::Test {
 protected:
  support::TestMetamodel tm;
  Model model = Model::create();
};

TEST_F(Serializer, AnEntryHoldsTypeIdentityAndEveryPersistentPropertyInIndexOrder) {
  ModelElement g = tm.gadget.instantiate(model);
  g.setPropertyValue(tm.scratch, Value::of(std::u16string(u"never written")));
  JSONSerializer serializer;
  const ordered_json document = write(serializer, g);
  EXPECT_EQ(memberNames(document), (std::vector<std::string>{"version", "entries"}));
  EXPECT_EQ(document["version"], "1.0");
  ASSERT_EQ(document["entries"].size(), 1u);
  const ordered_json& entry = document["entries"][0];
  EXPECT_EQ(memberNames(entry), (std::vector<std::string>{"type", "id", "content"}));
  EXPECT_EQ(entry["type"], "tm.Gadget");
  EXPECT_EQ(entry["id"], g.identifier());
  EXPECT_EQ(
      memberNames(entry["content"]),
      (std::vector<std::string>{"name", "count", "kind", "tags", "children", "parent", "friends", "best",
                                "index", "born", "code", "weight", "flag", "note", "scores", "spot"}))
      << "transient properties are never written";
  EXPECT_EQ(entry["content"]["count"], 7);
  EXPECT_EQ(entry["content"]["flag"], true);
  EXPECT_EQ(entry["content"]["kind"], "Plain");
  EXPECT_TRUE(entry["content"]["born"].is_null());

  serializer.getCustomizer().setShouldSkipDefaultValues(true);
  EXPECT_TRUE(write(serializer, g)["entries"][0]["content"].empty()) << "a new element holds only defaults";
  g.setPropertyValue(tm.count, Value::of(8));
  EXPECT_EQ(memberNames(write(serializer, g)["entries"][0]["content"]), (std::vector<std::string>{"count"}));
}

TEST_F(Serializer, SetsAreWrittenSortedAndSequencesInTheirOrder) {
  ModelElement a = tm.node.instantiate(model);
  std::vector<ModelElement> others;
  for (int i = 0; i < 6; ++i) others.push_back(tm.node.instantiate(model));
  for (auto it = others.rbegin(); it != others.rend(); ++it) {
    tm.refs(a, tm.friends)->add(*it);
    tm.refs(a, tm.children)->add(*it);
  }
  for (const char16_t* tag : {u"pear", u"apple", u"fig"})
    tm.values(a, tm.tags)->genericAdd(Value::of(std::u16string(tag)));
  JSONSerializer serializer;
  const ordered_json content = write(serializer, a)["entries"][0]["content"];
  std::vector<std::string> friends = content["friends"].get<std::vector<std::string>>();
  std::vector<std::string> byUuid;
  for (const ModelElement& e : others) byUuid.push_back(e.identifier());
  std::sort(byUuid.begin(), byUuid.end(),
            [](const std::string& x, const std::string& y) { return *parseUuid(x) < *parseUuid(y); });
  EXPECT_EQ(friends, byUuid);
  std::vector<std::string> children = content["children"].get<std::vector<std::string>>();
  std::vector<std::string> inserted;
  for (auto it = others.rbegin(); it != others.rend(); ++it) inserted.push_back(it->identifier());
  EXPECT_EQ(children, inserted);
  EXPECT_EQ(content["tags"], ordered_json({"apple", "fig", "pear"}));
}

TEST_F(Serializer, TheAggregateIsWrittenOnceEachEvenThroughCycles) {
  struct Friends final : SerializeCustomizer {
    explicit Friends(const support::TestMetamodel& m) : tm(m) {}
    std::vector<ModelElement> getAggregateMembers(const ModelElement& e) const override {
      return tm.refs(e, tm.friends)->getAllValues();
    }
    const support::TestMetamodel& tm;
  };
  ModelElement a = tm.node.instantiate(model), b = tm.node.instantiate(model), c = tm.node.instantiate(model);
  tm.node.instantiate(model);  // not a friend: not written
  tm.refs(a, tm.friends)->add(b);
  tm.refs(b, tm.friends)->add(c);
  tm.refs(c, tm.friends)->add(a);
  JSONSerializer serializer(nullptr, std::make_unique<Friends>(tm));
  const ordered_json entries = write(serializer, a)["entries"];
  ASSERT_EQ(entries.size(), 3u);
  EXPECT_EQ(entries[0]["id"], a.identifier()) << "the element itself comes first";
}

TEST_F(Serializer, AProxyIsWrittenByTheUuidItStandsFor) {
  ModelElement a = tm.node.instantiate(model);
  const Uuid absent = generateNewUuid();
  tm.refs(a, tm.friends)
      ->basicAddWithProxy(ModelElement::Impl::createProxy(model.getImpl(), tm.node, ProxyId{absent, {}}));
  JSONSerializer serializer;
  EXPECT_EQ(write(serializer, a)["entries"][0]["content"]["friends"], ordered_json::array({toText(absent)}));
}

TEST_F(Serializer, ValuesAreWrittenBare) {
  ModelElement a = tm.node.instantiate(model), b = tm.node.instantiate(model);
  tm.refs(a, tm.children)->add(b);
  JSONSerializer serializer;
  auto bare = [&](const Value& value) {
    ordered_json json;
    serializer.serialize(value, SerializationOutput::forIntermediateFormat(&json));
    return json;
  };
  EXPECT_EQ(bare(a.getPropertyValue(tm.children)), ordered_json::array({b.identifier()}));
  EXPECT_EQ(bare(b.getPropertyValue(tm.parent)), a.identifier());
  EXPECT_EQ(bare(a.getPropertyValue(tm.count)), 7);
  EXPECT_EQ(bare(a.getPropertyValue(tm.born)), nullptr);

  std::string text;
  serializer.serialize(a, SerializationOutput::forText(&text));
  EXPECT_EQ(ordered_json::parse(text), write(serializer, a));
}

// An entry written straight to text must be the entry's dump, byte for byte, whatever its
// strings hold: the escapes, the code points left as they are, and what a malformed UTF-16
// text becomes.
struct EntryTextCase {
  const char* what;
  std::u16string name;
};

class EntryText : public Serializer, public ::testing::WithParamInterface<EntryTextCase> {};

TEST_P(EntryText, IsTheDumpOfTheEntry) {
  ModelElement g = tm.gadget.instantiate(model);
  tm.setName(g, GetParam().name);
  for (const int count : {std::numeric_limits<int>::min(), -1, 0, std::numeric_limits<int>::max()}) {
    g.setPropertyValue(tm.count, Value::of(count));
    g.setPropertyValue(tm.flag, Value::of(count > 0));
    for (const bool skipDefaults : {false, true}) {
      JSONSerializer serializer;
      serializer.getCustomizer().setShouldSkipDefaultValues(skipDefaults);
      EXPECT_EQ(serializer.writeEntryText(g), serializer.writeEntry(g).dump()) << count;
    }
  }
}

std::u16string everyControlCharacter() {
  std::u16string text;
  for (char16_t c = 0; c < 0x20; ++c) text += c;
  return text + u"\x7f";
}

INSTANTIATE_TEST_SUITE_P(
    Strings, EntryText,
    ::testing::Values(EntryTextCase{"empty", u""}, EntryTextCase{"plain", u"plain words"},
                      EntryTextCase{"quote and backslash", u"say \"\\\" twice\\"},
                      EntryTextCase{"control characters", everyControlCharacter()},
                      EntryTextCase{"an escape after a multi-byte character", u"\u00e9\n\u4e2d\t"},
                      EntryTextCase{"line and paragraph separators", u"\u2028\u2029"},
                      EntryTextCase{"a surrogate pair", u"\U0001F600"},
                      EntryTextCase{"a lone high surrogate", std::u16string(1, char16_t(0xD83D)) + u"x"},
                      EntryTextCase{"a lone low surrogate", u"x" + std::u16string(1, char16_t(0xDE00))}),
    [](const ::testing::TestParamInfo<EntryTextCase>& info) {
      std::string name = info.param.what;
      std::replace(name.begin(), name.end(), ' ', '_');
      name.erase(std::remove(name.begin(), name.end(), '-'), name.end());
      return name;
    });

// A large document is written into a text sized ahead from a sample of its entries. Whatever
// the sizes of its entries (a first one listing all the others, names of random lengths), the
// text is the document's dump and holds little unused room. (Documents of a few hundred
// entries are not sized ahead.)
class LargeDocument : public Serializer, public ::testing::WithParamInterface<unsigned> {};

TEST_P(LargeDocument, IsItsDumpAndLeavesLittleRoom) {
  std::mt19937 random(GetParam());
  const std::size_t count = std::uniform_int_distribution<std::size_t>(600, 3000)(random);
  ModelElement root = tm.node.instantiate(model);
  for (std::size_t i = 0; i < count; ++i) {
    ModelElement child = (random() % 4 == 0 ? tm.gadget : tm.node).instantiate(model);
    tm.setName(child, std::u16string(std::uniform_int_distribution<std::size_t>(0, 400)(random), u'x'));
    tm.refs(root, tm.children)->add(child);
  }
  JSONSerializer serializer;
  std::string text;
  serializer.serialize(model, SerializationOutput::forText(&text));
  EXPECT_EQ(text, support::serializeModel(model).dump());
  EXPECT_LT(text.capacity(), text.size() / 4 * 5) << count << " elements";
}

INSTANTIATE_TEST_SUITE_P(Seeds, LargeDocument, ::testing::Range(1u, 9u));

// A metamodel whose values need registered serializers: a C++ enumeration, and an
// opaque handle that must never reach a document.
enum class Colour { Red = 1, Blue = 2 };
struct Handle {
  int fd = 0;
};

class RegisteredSerializers : public ::testing::Test {
 protected:
  RegisteredSerializers() {
    auto& registry = meta::MetaRegistry::getInstance();
    package = meta::Package::create(metaModel, {}, u"/test/lamps", u"lamps");
    colourEnum = meta::Enum::create(metaModel, {}, u"Colour", u"lamps.Colour");
    colourEnum->addLiteral(meta::EnumLiteral::create(metaModel, {}, u"Red", 1));
    colourEnum->addLiteral(meta::EnumLiteral::create(metaModel, {}, u"Blue", 2));
    handleType = meta::PrimitiveType::create(metaModel, {}, u"Handle", u"lamps.Handle", nullptr);
    lamp = meta::Class::create(metaModel, {}, u"Lamp", u"lamps.Lamp", false);
    lamp->setSuperclass(ModelElement::metaClass());
    colour = meta::Property::create(metaModel, {}, u"colour", meta::ValueFlags::Single, false);
    colour->setType(colourEnum);
    colour->setPropertyIndex(1);
    handle = meta::Property::create(metaModel, {}, u"handle", meta::ValueFlags::Optional, false);
    handle->setType(handleType);
    handle->setPropertyIndex(2);
    lamp->addProperty(colour);
    lamp->addProperty(handle);
    for (const meta::Type& type : {meta::Type(colourEnum), meta::Type(handleType), meta::Type(lamp)})
      package->addType(type);
    registry.registerRootPackage(package);
    auto& serializers = meta::PropertySerializerRegistry::getInstance();
    serializers.registerPropertySerializer(
        colourEnum, std::make_unique<meta::DefaultPropertySerializer<Colour>>(colourEnum));
    serializers.registerPropertySerializer(handleType,
                                           std::make_unique<meta::TransientOnlyPropertySerializer<Handle>>());
  }
  ~RegisteredSerializers() override {
    meta::PropertySerializerRegistry::getInstance().unregister(colourEnum);
    meta::PropertySerializerRegistry::getInstance().unregister(handleType);
    meta::MetaRegistry::getInstance().unregisterRootPackage(u"/test/lamps");
  }

  Model metaModel = Model::create();
  meta::Package package;
  meta::Enum colourEnum;
  meta::PrimitiveType handleType;
  meta::Class lamp;
  meta::Property colour, handle;
};

TEST_F(RegisteredSerializers, DecideTheFormOfTheirValues) {
  Model model = Model::create();
  ModelElement a = lamp.instantiate(model);
  a.setPropertyValue(colour, Value::of(Colour::Blue));
  a.setPropertyValue(handle, Value::of(Handle{7}));
  const ordered_json document = support::serializeModel(model);
  EXPECT_EQ(document["entries"][0]["content"], ordered_json({{"colour", "Blue"}}))
      << "handles are never written";

  Model copy = Model::create();
  JSONParser().parseVerbatim(document, copy);
  const ModelElement b = copy->findElement(a.getUuid());
  EXPECT_EQ(b.getPropertyValue(colour).getValue<Colour>(), Colour::Blue);
  EXPECT_TRUE(b.getPropertyValue(handle).isEmpty());

  ordered_json bad = document;
  bad["entries"][0]["content"]["colour"] = "Green";
  EXPECT_THROW(JSONParser().parseVerbatim(bad, Model::create()),
               foundation::core::except::Exception<qf0::messages::InvalidValue>);
}

}  // namespace
}  // namespace qf::zero::io
