// Documents written from random models read back into the same models.
#include "qf/zero/io/json_parser.h"
#include "qf/zero/io/json_serializer.h"
#include "support/json_documents.h"
#include "support/random_editor.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <random>

namespace qf::zero::io {
namespace {

using nlohmann::ordered_json;
using support::dumpModel;

class RoundTrip : public ::testing::TestWithParam<unsigned> {
 protected:
  void SetUp() override {
    support::RandomEditor editor(tm, original, GetParam());
    for (int i = 0; i < 120; ++i) {
      editor.step();
      if (HasFatalFailure()) return;
    }
  }
  Model parse(const ordered_json& document) {
    Model copy = Model::create();
    JSONParser().parseVerbatim(document, copy);
    return copy;
  }

  support::TestMetamodel tm;
  Model original = Model::create();
};

TEST_P(RoundTrip, ParsingAWrittenModelGivesItBackAndWritesTheSameDocument) {
  SCOPED_TRACE("seed " + std::to_string(GetParam()));
  const ordered_json document = support::serializeModel(original);
  const Model copy = parse(document);
  EXPECT_EQ(dumpModel(original, false), dumpModel(copy, false));
  EXPECT_EQ(document.dump(), support::serializeModel(copy).dump());
}

// The text path writes entry by entry; it must give the document's own dump, whatever the
// model holds and whether defaults are written or not.
TEST_P(RoundTrip, WrittenAsTextADocumentIsItsDump) {
  SCOPED_TRACE("seed " + std::to_string(GetParam()));
  for (const bool skipDefaults : {false, true}) {
    JSONSerializer serializer;
    serializer.getCustomizer().setShouldSkipDefaultValues(skipDefaults);
    std::string text;
    serializer.serialize(original, SerializationOutput::forText(&text));
    EXPECT_EQ(text, support::serializeModel(original, skipDefaults).dump());
    for (const ModelElement& element :
         original->getInstances(ModelElement::metaClass(), query::SearchClassMatchMode::IncludeSubclasses)) {
      ASSERT_EQ(serializer.writeEntryText(element), serializer.writeEntry(element).dump());
    }
    std::vector<ModelElement> tops = original->getTopLevelElements();
    if (tops.empty()) continue;
    ordered_json document;
    serializer.serialize(tops, SerializationOutput::forIntermediateFormat(&document));
    serializer.serialize(tops, SerializationOutput::forText(&text));
    EXPECT_EQ(text, document.dump());
  }
}

TEST_P(RoundTrip, EntriesMayComeInAnyOrder) {
  SCOPED_TRACE("seed " + std::to_string(GetParam()));
  ordered_json document = support::serializeModel(original);
  auto& entries = document["entries"];
  std::shuffle(entries.begin(), entries.end(), std::mt19937(GetParam()));
  const Model copy = parse(document);
  EXPECT_EQ(support::entriesById(document), support::entriesById(support::serializeModel(copy)));
}

TEST_P(RoundTrip, ADocumentWithoutDefaultsReadsBackTheSame) {
  SCOPED_TRACE("seed " + std::to_string(GetParam()));
  const ordered_json sparse = support::serializeModel(original, true);
  const ordered_json full = support::serializeModel(original);
  EXPECT_LE(sparse.dump().size(), full.dump().size());
  EXPECT_EQ(full.dump(), support::serializeModel(parse(sparse)).dump());
}

INSTANTIATE_TEST_SUITE_P(Seeds, RoundTrip, ::testing::Range(1u, 21u));

}  // namespace
}  // namespace qf::zero::io
