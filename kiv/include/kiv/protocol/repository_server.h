// RepositoryServer: one local repository served to many connections at once.
//
//   kiv::protocol::RepositoryServer server(bareRepository);
//   server.addConnection(channel);   // per peer: an in-process end, an accepted WebSocket...
//   ...                              // peers clone, push, pull and observe through it
//   server.close();                  // or let it go out of scope
//
// Each connection gets its own transport, so any number of peers may have requests in
// flight at once; the requests that use the repository ("PullInfo", "Pull", "Push",
// "AddRemoteObserver", "RemoveRemoteObserver") are answered one at a time, so the
// repository model is never used by two threads at once, and each reply goes to the
// connection that asked. After a push has been taken over, every observing connection
// is sent one "RepositoryModified" packet. A connection counts as an observer at most
// once, and stops counting when it closes. A request that fails is answered "Error" and
// changes nothing (see packet_answers.h); the server goes on serving.
//
// While the server runs, it alone uses the served repository and its model: the owner
// leaves them alone until close() has returned. Every member may be called from any
// thread but a connection's own handlers.
#pragma once

#include "kiv/metamodel/local_repository.h"
#include "qf/zero/io/synchronization_channel.h"

#include <chrono>
#include <cstddef>
#include <memory>

namespace kiv::protocol {

// Serves one local repository to any number of connections, taking the requests that use it
// one at a time. The owner leaves the repository alone until close() has returned.
class RepositoryServer {
 public:
  // REQUIRES: `served` is a live local repository ("ElementRequired" otherwise).
  explicit RepositoryServer(LocalRepository served);
  // close().
  ~RepositoryServer();
  RepositoryServer(const RepositoryServer&) = delete;
  RepositoryServer& operator=(const RepositoryServer&) = delete;

  // Serves one more peer over `channel`, which must not be started. Raises
  // "ChannelClosed" once the server is closed.
  void addConnection(std::shared_ptr<qf::zero::io::SynchronizationChannel> channel);

  // Connections still open, and how many of them observe the repository.
  std::size_t connectionCount() const;
  std::size_t observerCount() const;

  // Closes the connections that have made no request for longer than `idle`, except those
  // that observe the repository (waiting for notices is what they are there for). Returns
  // how many it closed. Call it now and then (kiv-serve does, every second).
  std::size_t closeIdle(std::chrono::milliseconds idle);

  // Closes every connection and waits for their handlers to end. Idempotent.
  void close();

 private:
  struct State;
  std::shared_ptr<State> state_;
};

}  // namespace kiv::protocol
