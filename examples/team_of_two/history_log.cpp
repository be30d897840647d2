#include "history_log.h"

#include "kiv/metamodel/branch_impl.h"
#include "kiv/metamodel/commit_impl.h"
#include "kiv/metamodel/repository_impl.h"
#include "qf/zero/core/text.h"
#include "qf/zero/core/uuid.h"

#include <algorithm>
#include <iomanip>
#include <iostream>
#include <set>
#include <sstream>
#include <vector>

namespace team_of_two {

namespace {

std::string join(const std::vector<std::string>& parts, const char* separator) {
  std::string result;
  for (const std::string& part : parts) result += (result.empty() ? "" : separator) + part;
  return result;
}

// Appends the commits reachable from `commit` that are not yet in `seen`, each after all of
// its parents: reversed, the list puts every commit before its parents.
void visit(const kiv::Commit& commit, std::set<std::string>& seen, std::vector<kiv::Commit>& parentsFirst) {
  if (!commit || !seen.insert(HistoryLog::shortId(commit)).second) return;
  for (const kiv::Commit& parent : commit->getParents().getTypedValues()) visit(parent, seen, parentsFirst);
  parentsFirst.push_back(commit);
}

}  // namespace

void HistoryLog::note(const kiv::Commit& commit, std::string what) {
  if (commit) notes_[shortId(commit)] = std::move(what);
}

std::string HistoryLog::shortId(const kiv::Commit& commit) {
  return commit ? qf::zero::toText(commit.getUuid()).substr(0, 6) : "------";
}

void HistoryLog::show(const kiv::Repository& repository, const std::string& heading) const {
  std::map<std::string, std::vector<std::string>> labels;  // by shortId
  std::set<std::string> seen;
  std::vector<kiv::Commit> parentsFirst;
  // Branches in name order, and on each the redo stack before the tip, so that an undone
  // commit prints above the commit it was undone to.
  for (const auto& [name, branch] : repository->getBranches().container()) {
    const std::string branchName = qf::zero::toUtf8(name);
    labels[shortId(branch->getTip())].push_back(branchName);
    for (const kiv::Commit& undone : branch->getRedoStack().getTypedValues()) {
      labels[shortId(undone)].push_back("undone on " + branchName);
      visit(undone, seen, parentsFirst);
    }
    visit(branch->getTip(), seen, parentsFirst);
  }
  const kiv::Branch head = repository->getHead();
  std::cout << heading << " (head: " << (head ? qf::zero::toUtf8(head->getName()) : "none") << "):\n";
  if (parentsFirst.empty()) std::cout << "    (no commits)\n";
  std::reverse(parentsFirst.begin(), parentsFirst.end());
  for (const kiv::Commit& commit : parentsFirst) {
    const std::string id = shortId(commit);
    std::vector<std::string> parents;
    for (const kiv::Commit& parent : commit->getParents().getTypedValues())
      parents.push_back(shortId(parent));
    const auto label = labels.find(id);
    const std::string names = label == labels.end() ? "" : "(" + join(label->second, ", ") + ")";
    const auto noted = notes_.find(id);
    std::ostringstream line;
    line << "    * " << id << " " << std::left << std::setw(20) << names << " <- " << std::setw(16)
         << (parents.empty() ? "(first)" : join(parents, ", ")) << " "
         << (noted == notes_.end() ? "" : noted->second);
    std::string text = line.str();
    text.erase(text.find_last_not_of(' ') + 1);
    std::cout << text << "\n";
  }
}

}  // namespace team_of_two
