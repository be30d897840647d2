// ann and bob share a task board through kiv-serve, over a real network on this machine.
//
// The example starts kiv-serve on a free loopback port: it serves one bare repository over
// WebSocket. Each person's process would look like this one's half: a repository model of
// their own holding a proxy of the served repository (kiv::RemoteRepository, reached
// through a WebSocket channel) and a clone of it, and a user model bound to the clone's
// workspace. ann adds cards and pushes; bob clones and sees them. Both change the Login
// page: ann pushes first, bob's plain push is refused and his push that merges first goes
// through; ann, observing the server, is told and pulls. Both end with equal boards and
// histories, or the example exits with 1.
//
// Commit ids are the first digits of random UUIDs: they differ from run to run.
#include "board.h"
#include "history_log.h"
#include "kiv/kiv.h"
#include "kiv/repository/notice_executor.h"
#include "kiv/workspace/load_context.h"
#include "qf/zero/io/websocket_channel.h"
#include "server_process.h"

#include <chrono>
#include <future>
#include <iostream>
#include <memory>
#include <string>

using qf::zero::Model;
using team_of_two::Board;
using team_of_two::HistoryLog;

namespace {

using RefusedPush = foundation::core::except::Exception<kiv::messages::CannotPush>;

struct Member {
  std::string name;
  Model repositories = Model::create();
  Model user = Model::create();
  kiv::RemoteRepository server;
  kiv::LocalRepository repository;
  kiv::Workspace workspace;

  kiv::Commit tip() const { return repository->getHead()->getTip(); }
};

// Connects to the server, clones what it holds and shows it in a new user model.
Member join(std::uint16_t port, std::string name) {
  Member member;
  member.name = std::move(name);
  {
    qf::zero::Transaction transaction = member.repositories->beginTransaction();
    member.server = kiv::RemoteRepository::create(member.repositories);
    transaction.commit();
  }
  member.server->setSynchronizationChannel(qf::zero::io::WebSocketChannel::connect("127.0.0.1", port));
  member.repository = member.server->synchronousClone(kiv::RepoType::Regular);
  member.workspace = member.repository->getWorkspace(member.user);
  kiv::loadContext(member.workspace);
  return member;
}

void section(const std::string& title) { std::cout << "\n== " << title << "\n"; }

const char* yesNo(bool value) { return value ? "yes" : "no"; }

bool push(const Member& member, kiv::PushMode mode) {
  const char* modeName = mode == kiv::PushMode::TryPush ? "TryPush" : "MergeFirst";
  try {
    member.workspace->push(mode).get();
    std::cout << member.name << " pushes (" << modeName << "): accepted\n";
    return true;
  } catch (const RefusedPush& refused) {
    std::cout << member.name << " pushes (" << modeName << "): refused with " << refused.GetID() << "\n";
    return false;
  }
}

void pull(const Member& member) {
  member.workspace->pull().get();
  std::cout << member.name << " pulls: " << qf::zero::toUtf8(member.repository->getHead()->getName())
            << " at " << HistoryLog::shortId(member.tip()) << "\n";
}

}  // namespace

int main() {
  kiv::MetaPackageKiv::getInstance();
  const Board board;
  HistoryLog log;

  section("kiv-serve serves a bare repository");
  kiv::serve::ServerProcess server(KIV_SERVE_PROGRAM);
  std::cout << server.greeting() << "\n";

  section("ann clones it over the network, adds cards and pushes");
  Member ann = join(server.port(), "ann");
  ann.workspace->commitTransaction([&] {
    board.addCard(ann.user, u"Login page", 3, {u"auth"});
    board.addCard(ann.user, u"Search", 5, {u"backend"});
  });
  log.note(ann.tip(), "ann: two cards");
  if (!push(ann, kiv::PushMode::TryPush)) return 1;
  // From now on a change on the server is told to ann; she pulls when she is ready.
  auto notices = std::make_shared<kiv::QueuedNoticeExecutor>();
  kiv::setNoticeExecutor(ann.repository, notices);
  ann.repository->startObservingOrigin();

  section("bob clones it and sees ann's cards");
  Member bob = join(server.port(), "bob");
  board.show(bob.user, "bob's board:");
  // bob merges property by property: when both change one card, both changes stay.
  {
    qf::zero::Transaction transaction = bob.repositories->beginTransaction();
    bob.repository->setIMergeStrategy(
        std::make_shared<kiv::RecursiveMerge3Strategy>(std::make_unique<kiv::PropertyMergeTool>()));
    transaction.commit();
  }

  section("Both change the Login page; ann pushes first");
  bob.workspace->commitTransaction([&] { board.setPoints(board.card(bob.user, u"Login page"), 5); });
  log.note(bob.tip(), "bob: Login page is 5 points");
  ann.workspace->commitTransaction([&] { board.addTag(board.card(ann.user, u"Login page"), u"urgent"); });
  log.note(ann.tip(), "ann: Login page is #urgent");
  if (!push(ann, kiv::PushMode::TryPush)) return 1;
  notices->runPending();  // the notice of her own push: nothing new to pull

  section("bob's plain push is refused; merging first, it goes through");
  if (push(bob, kiv::PushMode::TryPush)) return 1;
  if (!push(bob, kiv::PushMode::MergeFirst)) return 1;
  log.note(bob.tip(), "bob: merge of the server's master, made by his push");
  bob.workspace->updateContext();
  board.show(bob.user, "bob's board:");
  log.show(bob.repository, "bob's history");

  section("ann is told of bob's push and pulls");
  if (!notices->waitForWork(std::chrono::seconds(30))) {
    std::cout << "ann heard nothing\n";
    return 1;
  }
  std::cout << "ann hears: the server changed\n";
  notices->runPending();
  pull(ann);
  board.show(ann.user, "ann's board:");
  log.show(ann.repository, "ann's history");

  section("Where everyone stands");
  const bool sameHistory = ann.repository->isEquivalent(bob.repository);
  const bool sameCards = board.lines(ann.user) == board.lines(bob.user);
  std::cout << "ann's and bob's histories are equivalent: " << yesNo(sameHistory) << "\n"
            << "ann and bob see the same cards: " << yesNo(sameCards) << "\n";
  ann.repository->stopObservingOrigin();
  return sameHistory && sameCards ? 0 : 1;
}
