#include "serve_options.h"

#include <charconv>
#include <limits>

namespace kiv::serve {

namespace {

// A whole decimal number in [least, most], or nothing.
std::optional<std::uint64_t> readNumber(const std::string& text, std::uint64_t least, std::uint64_t most) {
  std::uint64_t value = 0;
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), value);
  if (error != std::errc() || end != text.data() + text.size() || value < least || value > most) return {};
  return value;
}

}  // namespace

std::string serveUsage() {
  return "Usage: kiv-serve --port PORT [options]\n"
         "\n"
         "Serves one bare repository over WebSocket (ws://HOST:PORT/) to many clients: they\n"
         "clone it, push to it, pull from it and are told when it changes. Stops cleanly on\n"
         "SIGINT or SIGTERM. Once listening it prints one line:\n"
         "  kiv-serve: listening on ws://HOST:PORT/\n"
         "\n"
         "Options:\n"
         "  --port PORT            TCP port to listen on; 0 picks a free one (required)\n"
         "  --host ADDRESS         address to listen on (default 127.0.0.1)\n"
         "  --max-packet BYTES     largest packet accepted or sent (default 16777216)\n"
         "  --max-connections N    connections served at once; more are closed at once\n"
         "                         (default 64)\n"
         "  --token TOKEN          serve only clients that connect to ws://HOST:PORT/TOKEN;\n"
         "                         others are answered 403 (letters, digits, '-', '_', '.')\n"
         "  --idle-seconds N       close a connection that has made no request for N\n"
         "                         seconds, unless it observes the repository; 0 never\n"
         "                         does (default 600)\n"
         "  --help                 print this text and exit\n";
}

ParsedOptions parseServeOptions(const std::vector<std::string>& arguments) {
  ServeOptions options;
  bool portGiven = false;
  for (std::size_t i = 0; i < arguments.size(); ++i) {
    const std::string& name = arguments[i];
    if (name == "--help" || name == "-h") {
      options.help = true;
      return {options, ""};
    }
    if (name != "--port" && name != "--host" && name != "--max-packet" && name != "--max-connections" &&
        name != "--idle-seconds" && name != "--token") {
      return {std::nullopt, "unknown option " + name};
    }
    if (i + 1 == arguments.size()) return {std::nullopt, name + " needs a value"};
    const std::string& value = arguments[++i];
    if (name == "--host") {
      if (value.empty()) return {std::nullopt, "--host needs an address"};
      options.host = value;
    } else if (name == "--port") {
      const auto port = readNumber(value, 0, std::numeric_limits<std::uint16_t>::max());
      if (!port) return {std::nullopt, "--port takes a number from 0 to 65535, not " + value};
      options.port = static_cast<std::uint16_t>(*port);
      portGiven = true;
    } else if (name == "--max-packet") {
      const auto bytes = readNumber(value, 1024, std::uint64_t{1} << 32);
      if (!bytes)
        return {std::nullopt, "--max-packet takes a number of bytes from 1024 to 4294967296, not " + value};
      options.maxPacketBytes = static_cast<std::size_t>(*bytes);
    } else if (name == "--token") {
      const bool plain = !value.empty() && value.find_first_not_of(
                                               "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz"
                                               "0123456789-_.") == std::string::npos;
      if (!plain) return {std::nullopt, "--token takes letters, digits, '-', '_' and '.' only"};
      options.token = value;
    } else if (name == "--idle-seconds") {
      const auto seconds = readNumber(value, 0, 31 * 24 * 3600);
      if (!seconds)
        return {std::nullopt, "--idle-seconds takes a number of seconds up to 2678400, not " + value};
      options.idleSeconds = static_cast<std::size_t>(*seconds);
    } else {
      const auto count = readNumber(value, 1, 100000);
      if (!count) return {std::nullopt, "--max-connections takes a number from 1 to 100000, not " + value};
      options.maxConnections = static_cast<std::size_t>(*count);
    }
  }
  if (!portGiven) return {std::nullopt, "--port is required"};
  return {options, ""};
}

}  // namespace kiv::serve
