#include "kiv/protocol/repository_server.h"

#include "kiv/metamodel/local_repository_impl.h"
#include "kiv/repository/packet_answers.h"
#include "qf/zero/core/messages.h"
#include "qf/zero/core/report_exception.h"
#include "qf/zero/io/packet_transport.h"
#include "repository/start_later_channel.h"

#include <nlohmann/json.hpp>

#include <functional>
#include <map>
#include <mutex>
#include <utility>
#include <vector>

namespace kiv::protocol {

namespace {

using qf::zero::io::JSONPacket;
using qf::zero::io::PacketTransport;

std::string textOf(PacketType type) { return Repository::Impl::toString(type); }

}  // namespace

struct RepositoryServer::State {
  struct Connection {
    std::shared_ptr<PacketTransport> transport;
    bool observing = false;
    std::chrono::steady_clock::time_point lastRequest = std::chrono::steady_clock::now();
  };

  void noteRequest(std::size_t id) {
    const std::lock_guard<std::mutex> lock(connectionsMutex);
    if (const auto found = connections.find(id); found != connections.end()) {
      found->second.lastRequest = std::chrono::steady_clock::now();
    }
  }

  explicit State(LocalRepository repository) : served(std::move(repository)) {}

  // Drops the connections that have closed, and their observation with them.
  // REQUIRES: `repositoryMutex` held, then `connectionsMutex`.
  void pruneClosed() {
    for (auto it = connections.begin(); it != connections.end();) {
      if (it->second.transport->isOpen()) {
        ++it;
        continue;
      }
      if (it->second.observing) answerObserver(served, false);
      it = connections.erase(it);
    }
  }

  // Marks a connection as observing or not; the repository counts each connection once.
  JSONPacket observe(std::size_t id, bool observing) {
    const std::lock_guard<std::mutex> repository(repositoryMutex);
    const std::lock_guard<std::mutex> lock(connectionsMutex);
    pruneClosed();
    const auto found = connections.find(id);
    if (found != connections.end() && found->second.observing != observing) {
      answerObserver(served, observing);
      found->second.observing = observing;
    }
    return JSONPacket(textOf(PacketType::OK), nullptr);
  }

  JSONPacket push(const JSONPacket& request) {
    const std::lock_guard<std::mutex> repository(repositoryMutex);
    JSONPacket reply = answerPush(served, request);
    if (reply.getType() != textOf(PacketType::OK)) return reply;
    const std::lock_guard<std::mutex> lock(connectionsMutex);
    pruneClosed();
    for (const auto& [id, connection] : connections) {
      if (!connection.observing) continue;
      try {
        connection.transport->sendPacket(JSONPacket(textOf(PacketType::RepositoryModified), nullptr));
      } catch (const foundation::core::except::ExceptionBase&) {
        // A peer that went away hears nothing more; it is dropped on the next pass.
      }
    }
    return reply;
  }

  template <class Answer>
  JSONPacket alone(Answer&& answer) {
    const std::lock_guard<std::mutex> repository(repositoryMutex);
    return answer();
  }

  LocalRepository served;
  // Taken first whenever both are held.
  std::mutex repositoryMutex;
  mutable std::mutex connectionsMutex;
  std::map<std::size_t, Connection> connections;
  std::size_t nextId = 0;
  bool closed = false;
};

RepositoryServer::RepositoryServer(LocalRepository served) {
  if (!served || !served.isLive()) {
    qf::zero::reportException(qf0::messages::ElementRequired(u"kiv.protocol.RepositoryServer"));
  }
  state_ = std::make_shared<State>(std::move(served));
}

RepositoryServer::~RepositoryServer() { close(); }

void RepositoryServer::addConnection(std::shared_ptr<qf::zero::io::SynchronizationChannel> channel) {
  if (!channel) qf::zero::reportException(qf0::messages::CannotCreateTransportWithoutChannel());
  auto held = std::make_shared<StartLaterChannel>(std::move(channel));
  auto transport = std::make_shared<PacketTransport>(held);
  std::size_t id = 0;
  {
    const std::lock_guard<std::mutex> lock(state_->connectionsMutex);
    if (state_->closed) {
      transport->close();
      qf::zero::reportException(qf0::messages::ChannelClosed("the server is closed"));
    }
    id = state_->nextId++;
    state_->connections.emplace(id, State::Connection{transport, false});
  }
  // Handlers hold the state weakly: a transport's handlers must not keep the server alive.
  const std::weak_ptr<State> weak = state_;
  const auto on = [&](PacketType type, std::function<JSONPacket(State&, const JSONPacket&)> answer) {
    transport->setPacketHandler(
        textOf(type),
        [weak, id, answer = std::move(answer)](const JSONPacket& request) -> boost::optional<JSONPacket> {
          const std::shared_ptr<State> state = weak.lock();
          if (!state) qf::zero::reportException(qf0::messages::ChannelClosed("the server is closed"));
          state->noteRequest(id);
          return answer(*state, request);
        },
        qf::zero::io::PacketPromiseMode::OnWorkerThread);
  };
  on(PacketType::PullInfo, [](State& state, const JSONPacket& request) {
    requireNullBody(request);
    return state.alone([&] { return answerPullInfo(state.served); });
  });
  on(PacketType::Pull, [](State& state, const JSONPacket& request) {
    return state.alone([&] { return answerPull(state.served, request); });
  });
  on(PacketType::Push, [](State& state, const JSONPacket& request) { return state.push(request); });
  on(PacketType::AddRemoteObserver, [id](State& state, const JSONPacket& request) {
    requireNullBody(request);
    return state.observe(id, true);
  });
  on(PacketType::RemoveRemoteObserver, [id](State& state, const JSONPacket& request) {
    requireNullBody(request);
    return state.observe(id, false);
  });
  held->open();
}

std::size_t RepositoryServer::connectionCount() const {
  const std::lock_guard<std::mutex> lock(state_->connectionsMutex);
  std::size_t open = 0;
  for (const auto& [id, connection] : state_->connections) open += connection.transport->isOpen() ? 1 : 0;
  return open;
}

std::size_t RepositoryServer::observerCount() const {
  const std::lock_guard<std::mutex> lock(state_->connectionsMutex);
  std::size_t observing = 0;
  for (const auto& [id, connection] : state_->connections) {
    observing += connection.observing && connection.transport->isOpen() ? 1 : 0;
  }
  return observing;
}

std::size_t RepositoryServer::closeIdle(std::chrono::milliseconds idle) {
  const auto now = std::chrono::steady_clock::now();
  std::vector<std::shared_ptr<PacketTransport>> idleOnes;
  {
    const std::lock_guard<std::mutex> lock(state_->connectionsMutex);
    for (const auto& [id, connection] : state_->connections) {
      if (!connection.observing && connection.transport->isOpen() && now - connection.lastRequest > idle) {
        idleOnes.push_back(connection.transport);
      }
    }
  }
  for (const auto& transport : idleOnes) transport->close();
  return idleOnes.size();
}

// The transports are closed outside the locks: closing waits for handlers that may be
// waiting for them.
void RepositoryServer::close() {
  std::vector<std::shared_ptr<PacketTransport>> transports;
  {
    const std::lock_guard<std::mutex> lock(state_->connectionsMutex);
    state_->closed = true;
    for (auto& [id, connection] : state_->connections) transports.push_back(connection.transport);
  }
  for (const auto& transport : transports) transport->close();
  const std::lock_guard<std::mutex> repository(state_->repositoryMutex);
  const std::lock_guard<std::mutex> lock(state_->connectionsMutex);
  state_->pruneClosed();
}

}  // namespace kiv::protocol
