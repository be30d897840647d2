#include "server_process.h"

#include <poll.h>
#include <signal.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <stdexcept>
#include <vector>

extern char** environ;

namespace kiv::serve {

namespace {

// The first line the child writes, waiting at most `seconds` for it.
std::string readLine(int fd, int seconds) {
  std::string line;
  char c = 0;
  while (true) {
    pollfd ready{fd, POLLIN, 0};
    if (poll(&ready, 1, seconds * 1000) <= 0) throw std::runtime_error("kiv-serve said nothing");
    if (read(fd, &c, 1) != 1) throw std::runtime_error("kiv-serve ended before it listened");
    if (c == '\n') return line;
    line.push_back(c);
  }
}

}  // namespace

ServerProcess::ServerProcess(const std::string& program, const std::vector<std::string>& options) {
  int pipeEnds[2];
  if (pipe(pipeEnds) != 0) throw std::runtime_error("cannot make a pipe");
  posix_spawn_file_actions_t actions;
  posix_spawn_file_actions_init(&actions);
  posix_spawn_file_actions_adddup2(&actions, pipeEnds[1], STDOUT_FILENO);
  posix_spawn_file_actions_addclose(&actions, pipeEnds[0]);
  std::vector<const char*> arguments{program.c_str(), "--port", "0"};
  for (const std::string& option : options) arguments.push_back(option.c_str());
  arguments.push_back(nullptr);
  const int spawned =
      posix_spawn(&pid_, program.c_str(), &actions, nullptr, const_cast<char**>(arguments.data()), environ);
  posix_spawn_file_actions_destroy(&actions);
  close(pipeEnds[1]);
  output_ = pipeEnds[0];
  if (spawned != 0) {
    close(output_);
    throw std::runtime_error("cannot start " + program);
  }
  try {
    greeting_ = readLine(output_, 10);
    // "kiv-serve: listening on ws://127.0.0.1:PORT/"
    const auto colon = greeting_.rfind(':');
    const auto slash = greeting_.rfind('/');
    if (colon == std::string::npos || slash == std::string::npos || slash < colon) {
      throw std::runtime_error("kiv-serve said: " + greeting_);
    }
    port_ = static_cast<std::uint16_t>(std::stoi(greeting_.substr(colon + 1, slash - colon - 1)));
  } catch (...) {
    stop();
    throw;
  }
}

ServerProcess::~ServerProcess() { stop(); }

int ServerProcess::stop() noexcept {
  int exitStatus = -1;
  if (pid_ > 0) {
    kill(pid_, SIGTERM);
    int status = 0;
    if (waitpid(pid_, &status, 0) == pid_ && WIFEXITED(status)) exitStatus = WEXITSTATUS(status);
    pid_ = -1;
  }
  if (output_ >= 0) close(output_);
  output_ = -1;
  return exitStatus;
}

}  // namespace kiv::serve
