// A kiv-serve started as a child process on a free loopback port, stopped with SIGTERM
// when the handle goes.
#pragma once

#include <sys/types.h>

#include <cstdint>
#include <string>
#include <vector>

namespace kiv::serve {

class ServerProcess {
 public:
  // Starts `program --port 0 options...` and waits (at most ten seconds) for the line that names the
  // port it listens on. Raises std::runtime_error when it cannot be started or says nothing.
  // `options` are passed on after "--port 0".
  explicit ServerProcess(const std::string& program, const std::vector<std::string>& options = {});
  ~ServerProcess();
  ServerProcess(const ServerProcess&) = delete;
  ServerProcess& operator=(const ServerProcess&) = delete;

  std::uint16_t port() const { return port_; }
  // What the server printed when it began listening.
  const std::string& greeting() const { return greeting_; }

  // Sends SIGTERM and waits for the server to end; returns its exit status (-1 when it did
  // not exit normally, or was stopped before).
  int stop() noexcept;

 private:
  pid_t pid_ = -1;
  int output_ = -1;
  std::uint16_t port_ = 0;
  std::string greeting_;
};

}  // namespace kiv::serve
