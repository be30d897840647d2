// Histories as packets, against nlohmann's own work on the same bytes, in one run:
//
//   - pack: a history of 1,000 commits of 10 cards (plus the initial commit of the 1,000
//     cards they edit) packed and written as text, against nlohmannDump: writing the same
//     document as text. The aim: at least half nlohmann's throughput.
//   - unpack: that text read back into a fresh model (parsed as the packet codec parses it,
//     then unpack, with every check a receiver makes), against nlohmannParse: nlohmann's
//     parse of the same text.
//   - Over WebSocket on loopback, against a RepositoryServer in this process:
//     cloneOverLoopback clones that history; pushThenPull is one 10-card commit pushed by
//     one client and pulled by another; noticeToModel is the time from an accepted push to
//     the observing client's user model showing it (notice, pull, rewrite).
//
// Cards are elements of about 260 bytes of JSON each.
#include "card_metamodel.h"
#include "kiv/kiv.h"
#include "kiv/metamodel/protocol/history_impl.h"
#include "kiv/protocol/history_text.h"
#include "kiv/protocol/repository_server.h"
#include "kiv/repository/notice_executor.h"
#include "kiv/workspace/load_context.h"
#include "qf/zero/core/json_parse.h"
#include "qf/zero/io/websocket_channel.h"

#include <benchmark/benchmark.h>

#include <nlohmann/json.hpp>

#include <chrono>
#include <memory>
#include <string>
#include <vector>

namespace {

using qf::zero::Model;
using qf::zero::ModelElement;
using qf::zero::Value;

const bench::CardMetamodel& cards() {
  static const bench::CardMetamodel instance(u"/bench/protocol", u"bp");
  return instance;
}

// 1,000 cards, then 1,000 commits of 10 of them each, and a history holding all of it.
struct PackedHistory {
  PackedHistory() {
    kiv::MetaPackageKiv::getInstance();
    repository = kiv::LocalRepository::create(repositories, user);
    repository->init(kiv::RepoType::Regular);
    kiv::Workspace workspace = repository->getWorkspace(user);
    std::vector<ModelElement> made;
    workspace->commitTransaction([&] {
      for (std::size_t i = 0; i < 1000; ++i) made.push_back(cards().makeCard(user, i));
    });
    std::size_t next = 0;
    for (int commit = 0; commit < 1000; ++commit) {
      workspace->commitTransaction([&] {
        for (int i = 0; i < 10; ++i, ++next) {
          made[next % made.size()].setPropertyValue(cards().weight, Value::of(static_cast<int>(next)));
        }
      });
    }
    qf::zero::Transaction transaction = repositories->beginTransaction();
    history = kiv::protocol::History::create(repositories);
    history->getCurrentMutable().add(repository->getHead());
    transaction.commit();
    document = history.pack();
    text = document.dump();
  }

  Model repositories = Model::create();
  Model user = Model::create();
  kiv::LocalRepository repository;
  kiv::protocol::History history;
  nlohmann::ordered_json document;
  std::string text;
};

const PackedHistory& packed() {
  static const PackedHistory instance;
  return instance;
}

void bytesCounter(benchmark::State& state) {
  state.SetBytesProcessed(static_cast<std::int64_t>(state.iterations() * packed().text.size()));
}

void pack(benchmark::State& state) {
  const PackedHistory& history = packed();
  for (auto _ : state) benchmark::DoNotOptimize(kiv::protocol::packAsText(history.history));
  bytesCounter(state);
  state.counters["commits"] = static_cast<double>(history.history.getCommits().size());
}

// The same through the document: pack() and then nlohmann's dump of it.
void packDocument(benchmark::State& state) {
  const PackedHistory& history = packed();
  for (auto _ : state) benchmark::DoNotOptimize(history.history.pack().dump());
  bytesCounter(state);
}

void nlohmannDump(benchmark::State& state) {
  const PackedHistory& history = packed();
  for (auto _ : state) benchmark::DoNotOptimize(history.document.dump());
  bytesCounter(state);
}

void unpack(benchmark::State& state) {
  const PackedHistory& history = packed();
  for (auto _ : state) {
    const Model target = Model::create();
    const Model known = Model::create();
    benchmark::DoNotOptimize(
        kiv::protocol::History::unpack(qf::zero::parseJson(history.text), target, known));
  }
  bytesCounter(state);
}

void nlohmannParse(benchmark::State& state) {
  const PackedHistory& history = packed();
  for (auto _ : state) benchmark::DoNotOptimize(nlohmann::ordered_json::parse(history.text));
  bytesCounter(state);
}

// A repository served over WebSocket on loopback by a server in this process.
class ServedOverLoopback {
 public:
  explicit ServedOverLoopback(const kiv::LocalRepository& served)
      : server_(served),
        listener_("127.0.0.1", 0, [this](std::shared_ptr<qf::zero::io::SynchronizationChannel> channel) {
          server_.addConnection(std::move(channel));
        }) {}

  std::uint16_t port() const { return listener_.getPort(); }

 private:
  kiv::protocol::RepositoryServer server_;
  qf::zero::io::WebSocketListener listener_;
};

// A client over loopback: its repository model with the proxy and the clone, and a user
// model bound to the clone's workspace.
struct Client {
  explicit Client(std::uint16_t port) {
    {
      qf::zero::Transaction transaction = repositories->beginTransaction();
      server = kiv::RemoteRepository::create(repositories);
      transaction.commit();
    }
    server->setSynchronizationChannel(qf::zero::io::WebSocketChannel::connect("127.0.0.1", port));
    repository = server->synchronousClone(kiv::RepoType::Regular);
    workspace = repository->getWorkspace(user);
    kiv::loadContext(workspace);
  }

  Model repositories = Model::create();
  Model user = Model::create();
  kiv::RemoteRepository server;
  kiv::LocalRepository repository;
  kiv::Workspace workspace;
};

void cloneOverLoopback(benchmark::State& state) {
  const PackedHistory& history = packed();
  ServedOverLoopback served(history.repository);
  for (auto _ : state) Client client(served.port());
  bytesCounter(state);
}

// Two clients of a bare server whose master holds 100 cards.
struct TwoClients {
  TwoClients() : served(bare()) {
    writer.workspace->commitTransaction([&] {
      for (std::size_t i = 0; i < 100; ++i) cardsOfWriter.push_back(cards().makeCard(writer.user, i));
    });
    writer.workspace->push(kiv::PushMode::TryPush).get();
    reader.workspace->pull().get();
  }

  const kiv::LocalRepository& bare() {
    kiv::MetaPackageKiv::getInstance();
    origin = kiv::LocalRepository::create(repositories, originUser);
    origin->init(kiv::RepoType::Bare);
    return origin;
  }

  // One commit of 10 cards by the writer, pushed.
  void editAndPush() {
    writer.workspace->commitTransaction([&] {
      for (int i = 0; i < 10; ++i, ++next) {
        cardsOfWriter[next % cardsOfWriter.size()].setPropertyValue(cards().weight,
                                                                    Value::of(static_cast<int>(next)));
      }
    });
    writer.workspace->push(kiv::PushMode::TryPush).get();
  }

  Model repositories = Model::create();
  Model originUser = Model::create();
  kiv::LocalRepository origin;
  ServedOverLoopback served;
  Client writer{served.port()};
  Client reader{served.port()};
  std::vector<ModelElement> cardsOfWriter;
  std::size_t next = 0;
};

void pushThenPull(benchmark::State& state) {
  TwoClients clients;
  for (auto _ : state) {
    clients.editAndPush();
    clients.reader.workspace->pull().get();
  }
}

void noticeToModel(benchmark::State& state) {
  TwoClients clients;
  auto notices = std::make_shared<kiv::QueuedNoticeExecutor>();
  kiv::setNoticeExecutor(clients.reader.repository, notices);
  clients.reader.repository->startObservingOrigin();
  for (auto _ : state) {
    clients.editAndPush();
    const auto accepted = std::chrono::steady_clock::now();
    if (!notices->waitForWork(std::chrono::seconds(30))) state.SkipWithError("no notice");
    notices->runPending();
    clients.reader.workspace->updateContext();
    state.SetIterationTime(
        std::chrono::duration<double>(std::chrono::steady_clock::now() - accepted).count());
  }
  clients.reader.repository->stopObservingOrigin();
}

BENCHMARK(pack)->Unit(benchmark::kMillisecond)->Repetitions(5)->ReportAggregatesOnly(true);
BENCHMARK(packDocument)->Unit(benchmark::kMillisecond)->Repetitions(5)->ReportAggregatesOnly(true);
BENCHMARK(nlohmannDump)->Unit(benchmark::kMillisecond)->Repetitions(5)->ReportAggregatesOnly(true);
BENCHMARK(unpack)->Unit(benchmark::kMillisecond)->Repetitions(5)->ReportAggregatesOnly(true);
BENCHMARK(nlohmannParse)->Unit(benchmark::kMillisecond)->Repetitions(5)->ReportAggregatesOnly(true);
BENCHMARK(cloneOverLoopback)->Unit(benchmark::kMillisecond)->Repetitions(5)->ReportAggregatesOnly(true);
BENCHMARK(pushThenPull)->Unit(benchmark::kMicrosecond)->Repetitions(5)->ReportAggregatesOnly(true);
BENCHMARK(noticeToModel)
    ->Unit(benchmark::kMicrosecond)
    ->UseManualTime()
    ->Repetitions(5)
    ->ReportAggregatesOnly(true);

}  // namespace
