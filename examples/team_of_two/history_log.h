// Prints a repository's history as a small text graph, newest first:
//
//   * 5c1e0a (master)        <- 3b7d22, 9f0c41  merge feature
//   * 9f0c41 (feature)       <- 3b7d22          feature: a card for dark mode
//
// one line per commit reachable from a branch (its tip or its redo stack): the first six
// hex digits of its UUID, the branches whose tip it is, its parents (the first is the line
// it continues) and what the story noted about it. Commits live in the repository model and
// are shared by UUID between the origin and its clones, so a note made once shows in every
// repository's print.
#pragma once

#include "kiv/metamodel/commit.h"
#include "kiv/metamodel/repository.h"

#include <map>
#include <string>

namespace team_of_two {

class HistoryLog {
 public:
  // Remembers what `commit` did. Null commits are ignored.
  void note(const kiv::Commit& commit, std::string what);
  void show(const kiv::Repository& repository, const std::string& heading) const;

  // The first six hex digits of the commit's UUID, "------" for none.
  static std::string shortId(const kiv::Commit& commit);

 private:
  std::map<std::string, std::string> notes_;  // by shortId
};

}  // namespace team_of_two
