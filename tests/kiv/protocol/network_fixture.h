// A bare repository behind a server, and clients that clone it through remote proxies, over
// in-process channels or WebSocket over loopback.
#pragma once

#include "kiv/metamodel/protocol/history_impl.h"
#include "kiv/metamodel/remote_repository_impl.h"
#include "kiv/protocol/repository_server.h"
#include "kiv/repository/packet_answers.h"
#include "kiv/repository/repository_fixture.h"
#include "qf/zero/io/in_process_channel.h"
#include "qf/zero/io/packet_transport.h"
#include "qf/zero/io/websocket_channel.h"

#include <functional>
#include <memory>

namespace repository_test {

using kiv::protocol::RepositoryServer;
using qf::zero::io::InProcessChannel;
using qf::zero::io::JSONPacket;
using qf::zero::io::PacketTransport;

// A client: its own repository model holding the origin's proxy and its clone, and a
// user model bound to the clone's workspace.
struct RemoteClone {
  Model repositories = Model::create();
  Model user = Model::create();
  kiv::RemoteRepository origin;
  kiv::LocalRepository repository;
  kiv::Workspace workspace;

  kiv::Commit tip() const { return repository->getHead()->getTip(); }
};

class OverTheNetwork : public ::testing::Test {
 protected:
  OverTheNetwork() {
    kiv::MetaPackageKiv::getInstance();
    served = kiv::LocalRepository::create(serverModel, serverUser);
    served->init(kiv::RepoType::Bare);
    server = std::make_unique<RepositoryServer>(served);
  }

  std::shared_ptr<qf::zero::io::SynchronizationChannel> connectToServer() {
    auto [mine, theirs] = InProcessChannel::createPair();
    server->addConnection(theirs);
    return mine;
  }

  // A WebSocket connection to the server over loopback, through a listener made on first use.
  std::shared_ptr<qf::zero::io::SynchronizationChannel> connectOverLoopback() {
    if (!listener) {
      listener = std::make_unique<qf::zero::io::WebSocketListener>(
          "127.0.0.1", 0, [this](std::shared_ptr<qf::zero::io::SynchronizationChannel> channel) {
            server->addConnection(std::move(channel));
          });
    }
    return qf::zero::io::WebSocketChannel::connect("127.0.0.1", listener->getPort());
  }

  RemoteClone cloneServed(bool overLoopback = false) {
    RemoteClone clone;
    {
      qf::zero::Transaction transaction = clone.repositories->beginTransaction();
      clone.origin = kiv::RemoteRepository::create(clone.repositories);
      transaction.commit();
    }
    clone.origin->setSynchronizationChannel(overLoopback ? connectOverLoopback() : connectToServer());
    clone.repository = clone.origin->synchronousClone(kiv::RepoType::Regular);
    clone.workspace = clone.repository->getWorkspace(clone.user);
    kiv::loadContext(clone.workspace);
    return clone;
  }

  ModelElement addNode(RemoteClone& clone, const std::u16string& name) { return addNodeTo(tm, clone, name); }

  // What the served repository holds, read while no request is in flight.
  std::string servedDump() const { return dumpOf(serverModel); }

  support::TestMetamodel tm;
  Model serverModel = Model::create();
  Model serverUser = Model::create();
  kiv::LocalRepository served;
  std::unique_ptr<RepositoryServer> server;
  std::unique_ptr<qf::zero::io::WebSocketListener> listener;  // closed before the server goes
};

}  // namespace repository_test
