// kiv-serve: serves one bare repository over WebSocket to many clients (see --help).
#include "kiv/kiv.h"
#include "kiv/protocol/repository_server.h"
#include "qf/zero/io/websocket_channel.h"
#include "serve_options.h"

#include <pthread.h>

#include <chrono>
#include <csignal>
#include <ctime>
#include <exception>
#include <iostream>
#include <memory>
#include <string>
#include <vector>

namespace {

int serve(const kiv::serve::ServeOptions& options, const sigset_t& stopSignals) {
  kiv::MetaPackageKiv::getInstance();
  const qf::zero::Model repositories = qf::zero::Model::create();
  const qf::zero::Model unusedUser = qf::zero::Model::create();
  const kiv::LocalRepository served = kiv::LocalRepository::create(repositories, unusedUser);
  served->init(kiv::RepoType::Bare);

  kiv::protocol::RepositoryServer server(served);
  qf::zero::io::WebSocketListener listener(
      options.host, options.port,
      [&](std::shared_ptr<qf::zero::io::SynchronizationChannel> channel) {
        if (server.connectionCount() >= options.maxConnections) {
          channel->close();
          return;
        }
        channel->setMaxMessageSize(options.maxPacketBytes);
        server.addConnection(std::move(channel));
      },
      options.token.empty() ? std::string() : "/" + options.token);
  std::cout << "kiv-serve: listening on ws://" << options.host << ":" << listener.getPort() << "/"
            << std::endl;

  // Once a second: close the connections that idled too long, unless a stop signal came.
  int received = -1;
  while (received < 0) {
    const timespec second{1, 0};
    received = sigtimedwait(&stopSignals, nullptr, &second);
    if (received < 0 && options.idleSeconds > 0) server.closeIdle(std::chrono::seconds(options.idleSeconds));
  }
  std::cout << "kiv-serve: stopping on " << (received == SIGINT ? "SIGINT" : "SIGTERM") << std::endl;
  listener.close();
  server.close();
  return 0;
}

}  // namespace

int main(int argc, char** argv) {
  const kiv::serve::ParsedOptions parsed =
      kiv::serve::parseServeOptions(std::vector<std::string>(argv + 1, argv + argc));
  if (!parsed.options) {
    std::cerr << "kiv-serve: " << parsed.error << "\n\n" << kiv::serve::serveUsage();
    return 2;
  }
  if (parsed.options->help) {
    std::cout << kiv::serve::serveUsage();
    return 0;
  }
  // The stop signals are blocked before any thread starts, so every thread inherits the
  // mask and only sigwait sees them.
  sigset_t stopSignals;
  sigemptyset(&stopSignals);
  sigaddset(&stopSignals, SIGINT);
  sigaddset(&stopSignals, SIGTERM);
  pthread_sigmask(SIG_BLOCK, &stopSignals, nullptr);
  try {
    return serve(*parsed.options, stopSignals);
  } catch (const std::exception& failure) {
    std::cerr << "kiv-serve: " << failure.what() << "\n";
    return 1;
  }
}
