// Change reports written from one model and applied to a copy of it.
#include "qf/zero/io/json_change_report_synchronizer.h"
#include "qf/zero/io/json_parser.h"
#include "support/json_documents.h"
#include "support/random_editor.h"

#include <gtest/gtest.h>

namespace qf::zero::io {
namespace {

using nlohmann::ordered_json;

// Writes the report of every committed transaction of the model it listens to.
struct ReportWriter : Listener {
  JSONSerializer serializer;
  ordered_json last;
  void transactionCommitted(const std::shared_ptr<ShallowChangeReport<ModelElement>>& report) {
    last = JSONChangeReportSynchronizer::writeChangeReport(*report, serializer);
  }
};

class ChangeReports : public ::testing::TestWithParam<unsigned> {
 protected:
  void SetUp() override { source->addShallowListener(&writer); }
  void TearDown() override { source->removeListener(&writer); }

  Model copyOf(const Model& model) {
    Model copy = Model::create();
    JSONParser().parseVerbatim(support::serializeModel(model), copy);
    return copy;
  }
  void apply(const ordered_json& report, const Model& model) {
    JSONChangeReportSynchronizer::applyChangeReportVerbatim(report, model, std::make_unique<ModelBuilder>());
  }

  support::TestMetamodel tm;
  Model source = Model::create();
  ReportWriter writer;
};

TEST_P(ChangeReports, ApplyingATransactionsReportToACopyReproducesIt) {
  SCOPED_TRACE("seed " + std::to_string(GetParam()));
  support::RandomEditor editor(tm, source, GetParam());
  for (int i = 0; i < 60; ++i) editor.step();
  const Model copy = copyOf(source);
  for (int round = 0; round < 5; ++round) {
    Transaction transaction = source->beginTransaction();
    for (int i = 0; i < 12; ++i) editor.step();
    transaction.commit();
    if (HasFatalFailure()) return;
    apply(writer.last, copy);
    ASSERT_EQ(support::entriesById(support::serializeModel(source)),
              support::entriesById(support::serializeModel(copy)))
        << "round " << round << ", report " << writer.last.dump();
  }
}

INSTANTIATE_TEST_SUITE_P(Seeds, ChangeReports, ::testing::Range(1u, 16u));

TEST_F(ChangeReports, ApplicationIsIdempotentAndCreatesWhatIsMissing) {
  ModelElement a = tm.node.instantiate(source);
  const Model copy = copyOf(source);
  {
    Transaction transaction = source->beginTransaction();
    ModelElement b = tm.leaf.instantiate(source);
    tm.refs(a, tm.children)->add(b);
    tm.setName(a, u"a");
    transaction.commit();
  }
  const ordered_json report = writer.last;
  ASSERT_EQ(report["added"].size(), 1u);
  ASSERT_EQ(report["modified"].size(), 1u);
  apply(report, copy);
  apply(report, copy);
  EXPECT_EQ(support::serializeModel(source).dump(), support::serializeModel(copy).dump());

  const Model empty = Model::create();
  apply(report, empty);
  EXPECT_EQ(empty->getElementCount(), 2u) << "a modified element the model lacks is made";

  a.destroy();
  apply(writer.last, copy);
  EXPECT_EQ(copy->getElementCount(), 0u) << "destroying a parent destroys what it contains";
  apply(writer.last, copy);  // destroyed elements the model does not hold are ignored
}

// A report that turns containment inside out must apply whatever the order of its
// entries: a parse that links as it reads would briefly make a circle.
TEST_F(ChangeReports, ContainmentTurnedInsideOutAppliesInEitherEntryOrder) {
  ModelElement a = tm.node.instantiate(source);
  ModelElement b = tm.node.instantiate(source);
  ModelElement c = tm.node.instantiate(source);
  tm.refs(a, tm.children)->add(b);
  tm.refs(b, tm.children)->add(c);
  const Model forward = copyOf(source);
  const Model backward = copyOf(source);
  {
    Transaction transaction = source->beginTransaction();
    tm.refs(a, tm.children)->remove(b);
    tm.refs(c, tm.children)->add(a);
    transaction.commit();
  }
  ordered_json reversed = writer.last;
  auto& modified = reversed["modified"];
  std::reverse(modified.begin(), modified.end());
  apply(writer.last, forward);
  apply(reversed, backward);
  const auto expected = support::entriesById(support::serializeModel(source));
  EXPECT_EQ(support::entriesById(support::serializeModel(forward)), expected);
  EXPECT_EQ(support::entriesById(support::serializeModel(backward)), expected);
}

TEST_F(ChangeReports, AMalformedReportChangesNothing) {
  ModelElement a = tm.node.instantiate(source);
  const Model copy = copyOf(source);
  const std::string before = support::dumpModel(copy);
  ordered_json report = {{"added", ordered_json::array()},
                         {"modified", ordered_json::array()},
                         {"destroyed", ordered_json::array({{{"type", "tm.Node"}, {"id", a.identifier()}}})}};
  report["modified"].push_back(
      {{"type", "tm.Node"}, {"id", toText(generateNewUuid())}, {"content", {{"count", "x"}}}});
  EXPECT_THROW(apply(report, copy), foundation::core::except::Exception<qf0::messages::WrongJsonType>);
  EXPECT_EQ(before, support::dumpModel(copy)) << "the destroy before the failure must be undone too";

  for (const ordered_json& bad : {ordered_json::array(), ordered_json{{"added", 3}},
                                  ordered_json{{"destroyed", ordered_json::array({{{"id", "nope"}}})}}}) {
    EXPECT_THROW(apply(bad, copy), foundation::core::except::Exception<qf0::messages::MalformedDocument>)
        << bad.dump();
  }
  EXPECT_EQ(before, support::dumpModel(copy));
}

}  // namespace
}  // namespace qf::zero::io
