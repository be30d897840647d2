// The command line of kiv-serve.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <vector>

namespace kiv::serve {

struct ServeOptions {
  std::string host = "127.0.0.1";
  std::uint16_t port = 0;  // 0: a free port, printed once listening
  std::size_t maxPacketBytes = std::size_t{16} * 1024 * 1024;
  std::size_t maxConnections = 64;
  std::size_t idleSeconds = 600;  // 0: connections may stay idle for ever
  std::string token;              // empty: no token is asked for
  bool help = false;
};

// What the command line asks for, or the reason it is wrong (for the user to read, with
// the usage below). `arguments` leaves out the program name.
struct ParsedOptions {
  std::optional<ServeOptions> options;
  std::string error;
};
ParsedOptions parseServeOptions(const std::vector<std::string>& arguments);

// The text --help prints.
std::string serveUsage();

}  // namespace kiv::serve
