// Two people, ann and bob, share a task board through a bare origin, all in one process.
//
// One repository model holds the origin and both clones; each person has a user model of
// their own, bound to their clone by a workspace. Every committed transaction of a user
// model becomes a commit on that person's current branch. ann edits, undoes and redoes,
// works on a branch and merges it, then pushes; bob observes the origin, so her push pulls
// into his clone at once, and he brings his user model up to date. Then both edit the same
// card: bob pushes first, ann's plain push is refused, and her push that merges first
// settles it. Then both work on for thirty rounds, each push merging the other's last one
// first. At the end the origin and both clones hold the same history and both users see
// the same cards.
//
// Commit ids are the first digits of random UUIDs: they differ from run to run.
#include "board.h"
#include "history_log.h"
#include "kiv/kiv.h"
#include "kiv/workspace/load_context.h"
#include "qf/zero/core/text.h"

#include <future>
#include <iostream>
#include <map>
#include <memory>
#include <string>
#include <utility>
#include <vector>

using qf::zero::Model;
using team_of_two::Board;
using team_of_two::HistoryLog;

namespace {

using RefusedPush = foundation::core::except::Exception<kiv::messages::CannotPush>;

struct Member {
  std::string name;
  Model user = Model::create();
  kiv::LocalRepository repository;
  kiv::Workspace workspace;

  kiv::Commit tip() const { return repository->getHead()->getTip(); }
};

// A clone of `origin` with a workspace over a new user model. Binding the workspace only
// records the head's tip as its context; loadContext makes the user model show it (here the
// origin has no commits yet, so the model stays empty either way).
Member join(const kiv::LocalRepository& origin, std::string name) {
  Member member;
  member.name = std::move(name);
  member.repository = kiv::LocalRepository::clone(origin, kiv::RepoType::Regular);
  member.workspace = member.repository->getWorkspace(member.user);
  kiv::loadContext(member.workspace);
  return member;
}

void section(const std::string& title) { std::cout << "\n== " << title << "\n"; }

const char* yesNo(bool value) { return value ? "yes" : "no"; }

// Waits for a push and reports how it ended. The checks a push can make at once (a
// diverged branch under TryPush, among others) raise from push() itself, on the calling
// thread; delivery to the origin happens on a worker and raises from get().
bool push(const Member& member, kiv::PushMode mode) {
  const char* modeName = mode == kiv::PushMode::TryPush ? "TryPush" : "MergeFirst";
  const char* raisedBy = "push()";
  try {
    std::future<void> delivered = member.workspace->push(mode);
    raisedBy = "get()";
    delivered.get();
    std::cout << member.name << " pushes (" << modeName << "): accepted\n";
    return true;
  } catch (const RefusedPush& refused) {
    std::cout << member.name << " pushes (" << modeName << "): refused by " << raisedBy << " with "
              << refused.GetID() << ", \"" << refused.what() << "\"\n";
    return false;
  }
}

// A workspace whose branch moved under it (a pull, a push that merged first) can make no
// commit until its context catches up; updateContext rewrites the user model to the tip.
void catchUp(const Board& board, const Member& member) {
  std::cout << member.name << " can commit: " << yesNo(member.workspace->canCommit()) << " (workspace at "
            << HistoryLog::shortId(member.workspace->getContext()) << ", "
            << qf::zero::toUtf8(member.repository->getHead()->getName()) << " at "
            << HistoryLog::shortId(member.tip()) << ")\n";
  board.show(member.user, member.name + "'s board before updateContext():");
  member.workspace->updateContext();
  board.show(member.user, member.name + "'s board after updateContext():");
  std::cout << member.name << " can commit: " << yesNo(member.workspace->canCommit()) << "\n";
}

// The commits behind `tip` and how many paths lead from it back to its first commits, a
// path being one choice of parent at every merge.
std::pair<std::size_t, double> commitsAndPaths(const kiv::Commit& tip) {
  std::map<const void*, double> paths;  // by commit, once all its parents are counted
  std::vector<std::pair<kiv::Commit, bool>> pending{{tip, false}};
  while (!pending.empty()) {
    auto [commit, parentsCounted] = pending.back();
    pending.pop_back();
    if (paths.count(commit.getImpl()) != 0) continue;
    const std::vector<kiv::Commit> parents = commit->getParents().getTypedValues();
    if (!parentsCounted) {
      pending.push_back({commit, true});
      for (const kiv::Commit& parent : parents) pending.push_back({parent, false});
      continue;
    }
    double count = parents.empty() ? 1 : 0;
    for (const kiv::Commit& parent : parents) count += paths.at(parent.getImpl());
    paths[commit.getImpl()] = count;
  }
  return {paths.size(), paths.at(tip.getImpl())};
}

}  // namespace

int main() {
  kiv::MetaPackageKiv::getInstance();
  const Board board;
  HistoryLog log;

  section("An origin and two clones");
  const Model repositories = Model::create();
  // A bare origin checks nothing out: its user model is required by create and stays empty.
  const Model originUser = Model::create();
  const kiv::LocalRepository origin = kiv::LocalRepository::create(repositories, originUser);
  origin->init(kiv::RepoType::Bare);
  Member ann = join(origin, "ann");
  Member bob = join(origin, "bob");
  // An observer pulls whenever the origin's branches change. The pull runs on the thread
  // that changed them (the worker of a push), while this thread waits for that push.
  bob.repository->startObservingOrigin();
  // ann merges property by property: when both change one card, both changes stay, where
  // the default tool would take the other side's card whole.
  {
    qf::zero::Transaction transaction = repositories->beginTransaction();
    ann.repository->setIMergeStrategy(
        std::make_shared<kiv::RecursiveMerge3Strategy>(std::make_unique<kiv::PropertyMergeTool>()));
    transaction.commit();
  }
  log.show(origin, "origin");
  std::cout << "ann and bob cloned it; bob observes it\n";

  section("ann edits: each transaction is a commit");
  ann.workspace->commitTransaction([&] {
    board.addCard(ann.user, u"Login page", 3, {u"auth"});
    board.addCard(ann.user, u"Search", 5, {u"backend"});
    board.addCard(ann.user, u"Settings", 2, {u"ui"});
  });
  log.note(ann.tip(), "ann: three cards");
  ann.workspace->commitTransaction([&] { board.setPoints(board.card(ann.user, u"Search"), 8); });
  log.note(ann.tip(), "ann: Search is 8 points");
  board.show(ann.user, "ann's board:");
  log.show(ann.repository, "ann's history");

  section("ann undoes and redoes");
  ann.workspace->undo();
  board.show(ann.user, "ann's board after undo():");
  log.show(ann.repository, "ann's history");
  std::cout << "can redo: " << yesNo(ann.workspace->canRedo()) << "\n";
  ann.workspace->redo();
  board.show(ann.user, "ann's board after redo():");

  section("ann works on a branch and merges it");
  ann.workspace->branch(u"feature");
  ann.workspace->commitTransaction([&] { board.addCard(ann.user, u"Dark mode", 3, {u"ui"}); });
  log.note(ann.tip(), "feature: a card for dark mode");
  ann.workspace->commitTransaction([&] { board.addTag(board.card(ann.user, u"Settings"), u"dark-mode"); });
  log.note(ann.tip(), "feature: Settings gets #dark-mode");
  board.show(ann.user, "ann's board on feature:");
  ann.workspace->checkout(u"master");
  board.show(ann.user, "ann's board after checkout(\"master\"), rewritten to master's tip:");
  ann.workspace->commitTransaction(
      [&] { board.setTitle(board.card(ann.user, u"Search"), u"Full-text search"); });
  log.note(ann.tip(), "ann: Search renamed");
  ann.workspace->merge(u"feature");
  log.note(ann.tip(), "merge feature");
  board.show(ann.user, "ann's board after merge(\"feature\"):");
  log.show(ann.repository, "ann's history");

  section("ann pushes; bob, observing the origin, pulls at once");
  if (!push(ann, kiv::PushMode::TryPush)) return 1;
  std::cout << "origin's master is now " << HistoryLog::shortId(origin->getHead()->getTip()) << "\n";
  log.show(bob.repository, "bob's history, pulled automatically");
  catchUp(board, bob);

  section("Both change the Login page; bob pushes first");
  bob.workspace->commitTransaction([&] { board.setPoints(board.card(bob.user, u"Login page"), 5); });
  log.note(bob.tip(), "bob: Login page is 5 points");
  if (!push(bob, kiv::PushMode::TryPush)) return 1;
  ann.workspace->commitTransaction([&] { board.addTag(board.card(ann.user, u"Login page"), u"urgent"); });
  log.note(ann.tip(), "ann: Login page is #urgent");
  board.show(bob.user, "bob's board:");
  board.show(ann.user, "ann's board:");
  log.show(origin, "origin");
  log.show(ann.repository, "ann's history");

  section("ann's plain push is refused; merging first, it goes through");
  if (push(ann, kiv::PushMode::TryPush)) return 1;
  if (!push(ann, kiv::PushMode::MergeFirst)) return 1;
  log.note(ann.tip(), "ann: merge of origin's master, made by her push");
  log.show(ann.repository, "ann's history");
  // The merge moved ann's master past her workspace, just as bob's pull moved his.
  catchUp(board, ann);
  std::cout << "bob's master, pulled automatically: " << HistoryLog::shortId(bob.tip()) << "\n";
  catchUp(board, bob);

  section("Thirty rounds: each edits a card and pushes, merging the other's last push first");
  // The history becomes a ladder of merges: the number of paths from the tip back to the
  // first commit doubles with every rung. Merging, pushing and pulling never take them one
  // by one, so the last round costs about what the first did.
  for (int round = 1; round <= 30; ++round) {
    for (Member* member : {&ann, &bob}) {
      member->workspace->updateContext();  // after a pull, or a merge its own push made
      const char16_t* title = member == &ann ? u"Full-text search" : u"Settings";
      member->workspace->commitTransaction([&] { board.setPoints(board.card(member->user, title), round); });
      member->workspace->push(kiv::PushMode::MergeFirst).get();
    }
  }
  ann.workspace->synchronousPull();  // bob's last push; bob observes, so he has ann's
  ann.workspace->updateContext();
  bob.workspace->updateContext();
  const auto [commits, paths] = commitsAndPaths(origin->getHead()->getTip());
  std::cout << "origin's master: " << commits << " commits; " << static_cast<unsigned long long>(paths)
            << " paths from its tip back to the first commit\n";
  board.show(ann.user, "ann's board:");

  section("Where everyone stands");
  const bool originAnn = origin->isEquivalent(ann.repository);
  const bool originBob = origin->isEquivalent(bob.repository);
  const bool annBob = ann.repository->isEquivalent(bob.repository);
  const bool sameCards = board.lines(ann.user) == board.lines(bob.user);
  std::cout << "origin equivalent to ann: " << yesNo(originAnn) << "\n"
            << "origin equivalent to bob: " << yesNo(originBob) << "\n"
            << "ann equivalent to bob:    " << yesNo(annBob) << "\n"
            << "ann and bob see the same cards: " << yesNo(sameCards) << "\n";
  bob.repository->stopObservingOrigin();
  return originAnn && originBob && annBob && sameCards ? 0 : 1;
}
