// kiv-serve as a program: started on a free port, served to clients over WebSocket, and
// stopped by SIGTERM with a clean exit.
#include "kiv/kiv.h"
#include "kiv/workspace/load_context.h"
#include "qf/zero/io/websocket_channel.h"
#include "server_process.h"
#include "support/test_metamodel.h"

#include <gtest/gtest.h>

#include <chrono>
#include <future>

namespace {

struct Client {
  explicit Client(std::uint16_t port, const std::string& target = "/") {
    {
      qf::zero::Transaction transaction = repositories->beginTransaction();
      server = kiv::RemoteRepository::create(repositories);
      transaction.commit();
    }
    server->setSynchronizationChannel(qf::zero::io::WebSocketChannel::connect("127.0.0.1", port, target));
    repository = server->synchronousClone(kiv::RepoType::Regular);
    workspace = repository->getWorkspace(user);
    kiv::loadContext(workspace);
  }

  qf::zero::Model repositories = qf::zero::Model::create();
  qf::zero::Model user = qf::zero::Model::create();
  kiv::RemoteRepository server;
  kiv::LocalRepository repository;
  kiv::Workspace workspace;
};

TEST(KivServe, ServesClientsOverWebSocketAndStopsCleanlyOnSigterm) {
  kiv::MetaPackageKiv::getInstance();
  support::TestMetamodel tm;
  kiv::serve::ServerProcess served(KIV_SERVE_PROGRAM);
  EXPECT_EQ(served.greeting().rfind("kiv-serve: listening on ws://127.0.0.1:", 0), 0u) << served.greeting();
  {
    Client ann(served.port());
    ann.workspace->commitTransaction([&] {
      qf::zero::ModelElement node = tm.node.instantiate(ann.user);
      tm.setName(node, u"from ann");
    });
    std::future<void> pushed = ann.workspace->push(kiv::PushMode::TryPush);
    ASSERT_EQ(pushed.wait_for(std::chrono::seconds(30)), std::future_status::ready);
    pushed.get();

    Client bob(served.port());
    EXPECT_EQ(
        bob.user->getInstances(tm.node, qf::zero::query::SearchClassMatchMode::IncludeSubclasses).size(), 1u);
    EXPECT_TRUE(bob.repository->isEquivalent(ann.repository));
  }
  EXPECT_EQ(served.stop(), 0);
}

TEST(KivServe, WithATokenServesOnlyClientsThatPresentIt) {
  kiv::MetaPackageKiv::getInstance();
  kiv::serve::ServerProcess served(KIV_SERVE_PROGRAM, {"--token", "team-42"});
  using ConnectionFailed = foundation::core::except::Exception<qf0::messages::ConnectionFailed>;
  EXPECT_THROW(Client(served.port()), ConnectionFailed);
  EXPECT_THROW(Client(served.port(), "/team-43"), ConnectionFailed);
  Client member(served.port(), "/team-42");
  EXPECT_EQ(member.repository->getHead()->getName(), u"master");
  EXPECT_EQ(served.stop(), 0);
}

}  // namespace
