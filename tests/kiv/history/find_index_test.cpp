// Commit::find answers from an index of first-parent lines: on random histories
// (branches, merges, snapshot deltas, deletions, commits without a delta) it gives what
// the walk back along first parents gives, also after the history changes under it.
#include "history_fixture.h"

#include <random>

namespace {

using namespace history_test;

// The walk find stands for: the nearest first-parent ancestor (the commit first) whose
// delta holds a present storage of `element`, stopping after a snapshot.
kiv::ObjectStorage walk(kiv::Commit commit, const Uuid& element) {
  while (commit && commit.isLive()) {
    const kiv::Delta delta = commit->getDelta();
    if (delta && delta.isLive()) {
      if (kiv::ObjectStorage storage = delta->getCurrent(element)) return storage;
      if (delta.getIsSnapshot()) return {};
    }
    commit = commit->getParent();
  }
  return {};
}

class RandomLines {
 public:
  explicit RandomLines(unsigned seed) : random_(seed) {
    for (int i = 0; i < 6; ++i) elements_.push_back(qf::zero::generateNewUuid());
  }

  void grow(int count) {
    qf::zero::Transaction transaction = repository_->beginTransaction();
    for (int n = 0; n < count; ++n) {
      const kiv::Commit commit = kiv::Commit::create(repository_);
      if (!commits_.empty()) {
        commit->addParent(commits_[recent()]);
        if (chance(5)) {
          const kiv::Commit other = commits_[any()];
          if (other != commit->getParent()) commit->addParent(other);
        }
      }
      if (!chance(6)) commit->setDelta(randomDelta(chance(8)));
      commits_.push_back(commit);
    }
    transaction.commit();
  }

  // A change the index must notice: a storage added to or removed from an old delta, a
  // delta replaced or dropped, or an old storage destroyed.
  void disturb() {
    qf::zero::Transaction transaction = repository_->beginTransaction();
    const kiv::Commit commit = commits_[any()];
    const kiv::Delta delta = commit->getDelta();
    switch (pick(4)) {
      case 0:
        if (delta) {
          const Uuid element = elements_[pick(static_cast<int>(elements_.size()))];
          if (kiv::ObjectStorage held = delta->getCurrent(element)) {
            delta->getCurrentMutable().remove(held);
          } else {
            delta->addCreated(storageOf(repository_, element, "late"));
          }
        }
        break;
      case 1:
        commit->setDelta(randomDelta(chance(3)));
        break;
      case 2:
        commit->setDelta(kiv::Delta());
        break;
      case 3:
        if (delta && delta->getCurrent().size() != 0) delta->getCurrent().getTypedValues().front().destroy();
        break;
    }
    transaction.commit();
  }

  const std::vector<kiv::Commit>& commits() const { return commits_; }
  const std::vector<Uuid>& elements() const { return elements_; }
  int pick(int n) { return std::uniform_int_distribution<int>(0, n - 1)(random_); }

 private:
  kiv::Delta randomDelta(bool snapshot) {
    const kiv::Delta delta = kiv::Delta::create(repository_);
    delta->setIsSnapshot(snapshot);
    for (const Uuid& element : elements_) {
      const int what = pick(snapshot ? 2 : 5);
      const std::string state = "s" + std::to_string(++states_);
      if (what == 0) delta->addCreated(storageOf(repository_, element, state));
      if (what == 1 && snapshot) continue;
      if (what == 1) delta->addDeleted(storageOf(repository_, element, state));
    }
    return delta;
  }
  std::size_t recent() {
    const std::size_t window = std::min<std::size_t>(commits_.size(), 3);
    return commits_.size() - 1 - static_cast<std::size_t>(pick(static_cast<int>(window)));
  }
  std::size_t any() { return static_cast<std::size_t>(pick(static_cast<int>(commits_.size()))); }
  bool chance(int oneIn) { return pick(oneIn) == 0; }

  Model repository_ = Model::create();
  std::mt19937 random_;
  std::vector<Uuid> elements_;
  std::vector<kiv::Commit> commits_;
  int states_ = 0;
};

class FindIndex : public ::testing::TestWithParam<unsigned> {};

TEST_P(FindIndex, AnswersAsTheWalkDoes) {
  RandomLines lines(GetParam());
  lines.grow(40);
  for (int round = 0; round < 30; ++round) {
    // Questions come as recording asks them: several at one commit, then at its child.
    const auto& commits = lines.commits();
    const std::size_t start = static_cast<std::size_t>(lines.pick(static_cast<int>(commits.size())));
    for (std::size_t i = start; i < std::min(commits.size(), start + 4); ++i) {
      for (int ask = 0; ask < 2; ++ask) {
        for (const Uuid& element : lines.elements()) {
          ASSERT_EQ(commits[i]->find(element), walk(commits[i], element))
              << "commit " << i << ", element " << qf::zero::toText(element) << ", round " << round;
        }
      }
    }
    if (round % 3 == 2) lines.disturb();
    if (round % 5 == 4) lines.grow(3);
  }
}

INSTANTIATE_TEST_SUITE_P(Seeds, FindIndex, ::testing::Range(1u, 101u));

}  // namespace
