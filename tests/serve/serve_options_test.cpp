// The command line of kiv-serve.
#include "serve_options.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

namespace {

using kiv::serve::parseServeOptions;

struct CommandLine {
  std::string name;
  std::vector<std::string> arguments;
  std::string error;  // empty when the line is accepted
};

class ServeCommandLine : public ::testing::TestWithParam<CommandLine> {};

TEST_P(ServeCommandLine, IsAcceptedOrRefusedWithAReason) {
  const CommandLine& row = GetParam();
  const kiv::serve::ParsedOptions parsed = parseServeOptions(row.arguments);
  if (row.error.empty()) {
    EXPECT_TRUE(parsed.options) << parsed.error;
  } else {
    EXPECT_FALSE(parsed.options);
    EXPECT_EQ(parsed.error.rfind(row.error, 0), 0u) << parsed.error;
  }
}

const std::vector<CommandLine> commandLines = {
    {"PortOnly", {"--port", "0"}, ""},
    {"Everything",
     {"--port", "8080", "--host", "::", "--max-packet", "1048576", "--max-connections", "8", "--idle-seconds",
      "0"},
     ""},
    {"HelpWithoutPort", {"--help"}, ""},
    {"NoPort", {}, "--port is required"},
    {"PortTooLarge", {"--port", "65536"}, "--port takes"},
    {"PortNotANumber", {"--port", "80x"}, "--port takes"},
    {"NegativePort", {"--port", "-1"}, "--port takes"},
    {"PacketTooSmall", {"--port", "0", "--max-packet", "10"}, "--max-packet takes"},
    {"NoConnections", {"--port", "0", "--max-connections", "0"}, "--max-connections takes"},
    {"MissingValue", {"--port"}, "--port needs a value"},
    {"UnknownOption", {"--port", "0", "--verbose"}, "unknown option --verbose"},
    {"EmptyHost", {"--port", "0", "--host", ""}, "--host needs an address"},
    {"Token", {"--port", "0", "--token", "a-Z_0.9"}, ""},
    {"TokenWithASlash", {"--port", "0", "--token", "a/b"}, "--token takes"},
    {"EmptyToken", {"--port", "0", "--token", ""}, "--token takes"},
};

INSTANTIATE_TEST_SUITE_P(Rows, ServeCommandLine, ::testing::ValuesIn(commandLines),
                         [](const ::testing::TestParamInfo<CommandLine>& info) { return info.param.name; });

TEST(ServeCommandLineDefaults, AreTheDocumentedOnes) {
  const auto parsed = parseServeOptions({"--port", "0"});
  ASSERT_TRUE(parsed.options);
  EXPECT_EQ(parsed.options->host, "127.0.0.1");
  EXPECT_EQ(parsed.options->maxPacketBytes, 16u * 1024 * 1024);
  EXPECT_EQ(parsed.options->maxConnections, 64u);
  EXPECT_EQ(parsed.options->idleSeconds, 600u);
  EXPECT_NE(kiv::serve::serveUsage().find("--idle-seconds"), std::string::npos);
}

}  // namespace
