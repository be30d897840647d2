// Histories as packets: what a packed history carries, and what unpacking gives back.
#include "kiv/metamodel/protocol/history_impl.h"
#include "kiv/protocol/history_text.h"
#include "kiv/repository/repository_fixture.h"

#include <set>

namespace repository_test {
namespace {

class HistoryPackets : public ::testing::Test, public RepositoryModels {
 protected:
  // The origin's master as it is (previous) and the clone's master (current).
  kiv::protocol::History historyOfClone() {
    qf::zero::Transaction transaction = repositories->beginTransaction();
    const kiv::protocol::History history = kiv::protocol::History::create(repositories);
    history->getPreviousMutable().add(origin->getBranches().container().at(u"master"));
    history->getCurrentMutable().add(clone.head());
    transaction.commit();
    return history;
  }

  static std::set<qf::zero::Uuid> uuidsOf(const std::vector<kiv::Commit>& commits) {
    std::set<qf::zero::Uuid> result;
    for (const kiv::Commit& commit : commits) result.insert(commit.getUuid());
    return result;
  }

  template <class Set>
  static std::set<qf::zero::Uuid> uuidsIn(const Set& set) {
    std::set<qf::zero::Uuid> result;
    for (const auto& element : set.container()) result.insert(element.getUuid());
    return result;
  }

  Clone clone = cloneOrigin();
};

// Three commits, the second and third storing again an element the first created: the
// storage between them is shared by two deltas and travels once.
TEST_F(HistoryPackets, PackCarriesTheCommitsBetweenTheStatesWithTheirDeltasAndEachStorageOnce) {
  ModelElement node = addNode(clone, u"a");
  const kiv::Commit first = clone.tip();
  rename(clone, node, u"b");
  const kiv::Commit second = clone.tip();
  rename(clone, node, u"c");
  const kiv::Commit third = clone.tip();

  const kiv::protocol::History history = historyOfClone();
  const JsonValue document = history.pack();
  EXPECT_EQ(uuidsIn(history.getCommits()), uuidsOf({first, second, third}));
  EXPECT_EQ(history.getDeltas().size(), 3u);
  std::set<qf::zero::Uuid> storages;
  std::size_t references = 0;
  for (const kiv::Commit& commit : {first, second, third}) {
    for (const auto* side :
         {&commit->getDelta()->getPrevious().container(), &commit->getDelta()->getCurrent().container()}) {
      for (const auto& [uuid, storage] : *side) {
        storages.insert(storage.getUuid());
        ++references;
      }
    }
  }
  EXPECT_EQ(references, 5u) << "two storages are each named by two deltas";
  EXPECT_EQ(uuidsIn(history.getObjectStorages()), storages);
  EXPECT_EQ(document["entries"].size(), 1 + 2 + 3 + 3 + storages.size())
      << "the history, two branches, and every commit, delta and storage once";
  EXPECT_EQ(history.pack(), document) << "equal histories give identical documents";
}

// Written as text, a packed history is its document's dump: made, renamed and destroyed
// elements, a whole-state commit, and an empty history.
TEST_F(HistoryPackets, PackedAsTextAHistoryIsItsDocumentsDump) {
  const kiv::protocol::History empty = historyOfClone();
  EXPECT_EQ(kiv::protocol::packAsText(empty), empty.pack().dump());
  ModelElement node = addNode(clone, u"a");
  addNode(clone, u"b \u00e9\"\n");
  rename(clone, node, u"c");
  clone.workspace->commitTransaction([&] { node.destroy(); });
  clone.workspace->takeSnapshot();
  const kiv::protocol::History history = historyOfClone();
  const std::string text = kiv::protocol::packAsText(history);
  EXPECT_EQ(text, history.pack().dump());
  EXPECT_GT(history.getObjectStorages().size(), 3u);
}

TEST_F(HistoryPackets, EqualStatesPackNothingBetweenThem) {
  addNode(clone, u"a");
  const kiv::protocol::History history = historyOfClone();
  {
    qf::zero::Transaction transaction = repositories->beginTransaction();
    history->getPreviousMutable().clear();
    history->getPreviousMutable().add(clone.head());
    transaction.commit();
  }
  history.pack();
  EXPECT_EQ(history.getCommits().size(), 0u);
  EXPECT_EQ(history.getDeltas().size(), 0u);
  EXPECT_EQ(history.getObjectStorages().size(), 0u);
}

// An undone commit is part of the branch state the receiver takes over.
TEST_F(HistoryPackets, TheCommitsOfARedoStackTravelToo) {
  addNode(clone, u"a");
  addNode(clone, u"b");
  const kiv::Commit undone = clone.tip();
  clone.workspace->undo();
  const kiv::protocol::History history = historyOfClone();
  history.pack();
  EXPECT_EQ(history.getCommits().size(), 2u);
  EXPECT_TRUE(uuidsIn(history.getCommits()).count(undone.getUuid()));
}

TEST_F(HistoryPackets, UnpackingGivesAnEquivalentHistoryAndTheStagesReadTheirOwnSets) {
  addNode(clone, u"a");
  addNode(clone, u"b");
  const kiv::protocol::History history = historyOfClone();
  const JsonValue document = history.pack();

  const Model whole = Model::create();
  const kiv::protocol::History unpacked = kiv::protocol::History::unpack(document, whole, repositories);
  EXPECT_EQ(uuidsIn(unpacked.getCommits()), uuidsIn(history.getCommits()));
  EXPECT_EQ(uuidsIn(unpacked.getObjectStorages()), uuidsIn(history.getObjectStorages()));
  EXPECT_TRUE(unpacked->isEquivalent(history));
  EXPECT_TRUE(history->isEquivalent(unpacked));

  const Model branchesOnly = Model::create();
  const kiv::protocol::History branches = kiv::protocol::History::unpackBranches(document, branchesOnly);
  EXPECT_EQ(branches.getPrevious().size(), 1u);
  EXPECT_EQ(branches.getCurrent().size(), 1u);
  EXPECT_EQ(branches.getCommits().size(), 0u);
  const kiv::Commit tip = (*branches.getCurrent().container().begin())->getTip();
  ASSERT_TRUE(tip);
  EXPECT_TRUE(tip.isProxy()) << "a commit that is not read is stood for by a proxy";
  EXPECT_EQ(tip->getProxyId().elementId, clone.tip().getUuid());

  // Unpacked where the commits already are, nothing is made again or changed. (The sent
  // history itself is not there: a receiver never holds it.)
  const std::set<qf::zero::Uuid> carried = uuidsIn(history.getCommits());
  {
    qf::zero::Transaction transaction = repositories->beginTransaction();
    kiv::protocol::History(history).destroy();
    transaction.commit();
  }
  const std::string before = dumpOf(repositories);
  const kiv::protocol::History again = kiv::protocol::History::unpackNonBranches(document, repositories);
  EXPECT_EQ(uuidsIn(again.getCommits()), carried);
  {
    qf::zero::Transaction transaction = repositories->beginTransaction();
    kiv::protocol::History(again).destroy();
    transaction.commit();
  }
  EXPECT_EQ(dumpOf(repositories), before);
}

TEST_F(HistoryPackets, ClearEmptiesAllFiveSets) {
  addNode(clone, u"a");
  const kiv::protocol::History history = historyOfClone();
  history.pack();
  history->clear();
  EXPECT_EQ(history.getPrevious().size() + history.getCurrent().size() + history.getCommits().size() +
                history.getDeltas().size() + history.getObjectStorages().size(),
            0u);
}

}  // namespace
}  // namespace repository_test
