// Delta::compose: one delta for a sequence of deltas, written as a table of sequences
// and the delta each composes to.
#include "history_fixture.h"

#include <sstream>
#include <unordered_map>

namespace {

using namespace history_test;

// A delta is written as words: "+a1" creates element a with storage a1, "a0>a1" updates
// a from a0 to a1, "-a0" deletes a with a0, "!" makes it a snapshot. A label names one
// storage throughout a row; "~a0" is storage a0 destroyed once every delta is built.
// "null" is a null delta, "invert N" the inverse of the delta at position N and "as N"
// that very delta again. Sequences are written latest first, as compose takes them.
struct ComposeCase {
  const char* name;
  std::vector<std::string> latestFirst;
  std::string expected;
};

const ComposeCase kComposeCases[] = {
    {"OneDelta", {"+a1 b0>b1 -c0 !"}, "+a1 b0>b1 -c0 !"},
    {"CreatedThenUpdated", {"a1>a2", "+a1"}, "+a2"},
    {"CreatedThenDeleted", {"-a1", "+a1"}, ""},
    {"UpdatedThenInverted", {"invert 1", "a0>a1"}, ""},
    {"UpdatedUndoneAndRedone", {"a0>a1", "invert 0", "as 0"}, "a0>a1"},
    {"UpdatedTwice", {"a1>a2", "a0>a1"}, "a0>a2"},
    {"UpdatedThenDeleted", {"-a1", "a0>a1"}, "-a0"},
    {"DeletedThenCreatedAnew", {"+a1", "-a0"}, "a0>a1"},
    {"CreatedUpdatedDeleted", {"-a2", "a1>a2", "+a1"}, ""},
    {"DeletedCreatedDeleted", {"-a1", "+a1", "-a0"}, "-a0"},
    {"IndependentElements", {"+b1 c1>c2", "+a1 c0>c1 -d0"}, "+a1 +b1 c0>c2 -d0"},
    {"SnapshotInTheOldest", {"a1>a2", "a0>a1 !"}, "a0>a2 !"},
    {"SnapshotInTheLatest", {"!", "+a1"}, "+a1 !"},
    {"DestroyedStoragesIgnored", {"-~b0 +c1", "~a0>a1 +~d1"}, "+a1 +c1"},
    {"DestroyedDeletionDeletesNothing", {"-~a9", "+a1"}, "+a1"},
    {"NullDeltasCountAsEmpty", {"a1>a2", "null", "a0>a1"}, "a0>a2"},
    {"NullFirst", {"null", "+a1 !"}, "+a1 !"},
};

class DeltaCompose : public ::testing::TestWithParam<ComposeCase> {
 protected:
  static std::vector<std::string> words(const std::string& text) {
    std::istringstream in(text);
    std::vector<std::string> result;
    for (std::string word; in >> word;) result.push_back(word);
    return result;
  }

  kiv::ObjectStorage storage(std::string label) {
    const bool destroyed = label.front() == '~';
    if (destroyed) label.erase(0, 1);
    auto it = storages_.find(label);
    if (it == storages_.end()) {
      const auto [element, added] = elements_.try_emplace(label.front(), Uuid());
      if (added) element->second = qf::zero::generateNewUuid();
      it = storages_.emplace(label, storageOf(repository, element->second, label)).first;
      labels_[it->second] = label;
    }
    if (destroyed) doomed_.push_back(it->second);
    return it->second;
  }

  kiv::Delta build(const std::string& text) {
    if (text == "null") return {};
    const kiv::Delta delta = kiv::Delta::create(repository);
    for (const std::string& word : words(text)) {
      if (word == "!") {
        delta->setIsSnapshot(true);
      } else if (word.front() == '+') {
        delta.addCreated(storage(word.substr(1)));
      } else if (word.front() == '-') {
        delta.addDeleted(storage(word.substr(1)));
      } else {
        const auto arrow = word.find('>');
        delta.addUpdated(storage(word.substr(0, arrow)), storage(word.substr(arrow + 1)));
      }
    }
    return delta;
  }

  // The deltas of a row, with every "~" storage destroyed.
  std::vector<kiv::Delta> sequence(const std::vector<std::string>& latestFirst) {
    std::vector<kiv::Delta> deltas;
    for (const std::string& text : latestFirst) {
      const bool refers = text.rfind("invert ", 0) == 0 || text.rfind("as ", 0) == 0;
      deltas.push_back(refers ? kiv::Delta() : build(text));
    }
    for (std::size_t i = 0; i < latestFirst.size(); ++i) {
      const std::vector<std::string> w = words(latestFirst[i]);
      if (w.size() == 2 && (w[0] == "invert" || w[0] == "as")) {
        const kiv::Delta& target = deltas.at(std::stoul(w[1]));
        deltas[i] = w[0] == "invert" ? target.invert() : target;
      }
    }
    for (kiv::ObjectStorage& s : doomed_) s.destroy();
    return deltas;
  }

  // A delta in the words above, elements in name order; entries for elements of no
  // row are counted at the end.
  std::string describe(const kiv::Delta& delta) {
    std::string text;
    const auto word = [&](const std::string& w) { text += (text.empty() ? "" : " ") + w; };
    std::size_t present = 0;
    for (const auto& [name, uuid] : elements_) {
      const kiv::ObjectStorage before = delta.getPrevious(uuid), after = delta.getCurrent(uuid);
      if (before && after) word(labelOf(before) + ">" + labelOf(after));
      if (!before && after) word("+" + labelOf(after));
      if (before && !after) word("-" + labelOf(before));
      present += (before ? 1 : 0) + (after ? 1 : 0);
    }
    if (delta.getIsSnapshot()) word("!");
    const std::size_t entries =
        delta.getPrevious().container().size() + delta.getCurrent().container().size();
    if (entries != present) text += " (and " + std::to_string(entries - present) + " other entries)";
    return text;
  }

  std::string labelOf(const kiv::ObjectStorage& s) {
    const auto it = labels_.find(s);
    return it == labels_.end() ? "?" : it->second;
  }

  Model repository = Model::create();

 private:
  std::map<char, Uuid> elements_;
  std::map<std::string, kiv::ObjectStorage> storages_;
  std::unordered_map<kiv::ObjectStorage, std::string> labels_;
  std::vector<kiv::ObjectStorage> doomed_;
};

TEST_P(DeltaCompose, Gives) {
  const std::vector<kiv::Delta> deltas = sequence(GetParam().latestFirst);
  std::vector<std::string> inputs;
  for (const kiv::Delta& delta : deltas) inputs.push_back(delta ? describe(delta) : "null");

  const kiv::Delta composed = kiv::Delta::compose(deltas);
  ASSERT_TRUE(composed);
  EXPECT_EQ(describe(composed), GetParam().expected);
  EXPECT_EQ(composed.getModel(), repository);
  for (std::size_t i = 0; i < deltas.size(); ++i) {
    if (!deltas[i]) continue;
    EXPECT_NE(composed.getUuid(), deltas[i].getUuid()) << "a delta of its own";
    EXPECT_EQ(describe(deltas[i]), inputs[i]) << "delta " << i << " is left as it was";
  }
}

INSTANTIATE_TEST_SUITE_P(, DeltaCompose, ::testing::ValuesIn(kComposeCases), CaseName());

}  // namespace
