#include "protocol/history_checks.h"

#include "kiv/messages/messages.h"
#include "kiv/metamodel/branch_impl.h"
#include "kiv/metamodel/commit_impl.h"
#include "kiv/metamodel/delta_impl.h"
#include "kiv/metamodel/object_storage_impl.h"
#include "qf/zero/core/report_exception.h"

#include <set>
#include <string>
#include <unordered_map>
#include <vector>

namespace kiv::protocol {

namespace {

bool isPresent(const qf::zero::ModelElement& element) { return element && element.isLive(); }

template <class Set>
void checkNamesOnce(const Set& branches, const char* set) {
  std::set<std::u16string> names;
  for (const Branch& branch : branches.container()) {
    if (isPresent(branch) && !names.insert(branch->getName()).second) {
      qf::zero::reportException(messages::MalformedHistory(std::string("two branches of the ") + set +
                                                           " set are named " +
                                                           qf::zero::toUtf8(branch->getName())));
    }
  }
}

// Depth-first over the carried commits, without recursion: a peer chooses the depth.
void checkAcyclic(const History& history) {
  enum class Mark { Open, Done };
  std::unordered_map<Commit, Mark> marks;
  for (const Commit& start : history.getCommits().container()) {
    if (!isPresent(start) || marks.count(start)) continue;
    std::vector<std::pair<Commit, std::size_t>> stack{{start, 0}};
    marks[start] = Mark::Open;
    while (!stack.empty()) {
      auto& [commit, next] = stack.back();
      const auto& parents = commit->getParents().container();
      if (next == parents.size()) {
        marks[commit] = Mark::Done;
        stack.pop_back();
        continue;
      }
      const Commit parent = parents[next++];
      if (!isPresent(parent) || !history.getCommits().container().count(parent)) continue;
      const auto mark = marks.find(parent);
      if (mark == marks.end()) {
        marks[parent] = Mark::Open;
        stack.emplace_back(parent, 0);
      } else if (mark->second == Mark::Open) {
        qf::zero::reportException(messages::MalformedHistory("commit " + qf::zero::toText(parent.getUuid()) +
                                                             " is its own ancestor"));
      }
    }
  }
}

void checkDeltaKeys(const History& history) {
  for (const Delta& delta : history.getDeltas().container()) {
    if (!isPresent(delta)) continue;
    for (const auto* side : {&delta->getPrevious().container(), &delta->getCurrent().container()}) {
      for (const auto& [uuid, storage] : *side) {
        if (isPresent(storage) && storage->getElementUUID() != uuid) {
          qf::zero::reportException(messages::MalformedHistory("delta " + qf::zero::toText(delta.getUuid()) +
                                                               " files a storage under another element"));
        }
      }
    }
  }
}

}  // namespace

void checkReceivedHistory(const History& history) {
  checkNamesOnce(history.getPrevious(), "previous");
  checkNamesOnce(history.getCurrent(), "current");
  checkAcyclic(history);
  checkDeltaKeys(history);
}

}  // namespace kiv::protocol
