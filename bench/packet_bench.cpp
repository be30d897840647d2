// Round-trip latency of one request/reply exchange (PacketTransport::sendAndExpectPacket) whose
// peer echoes the body back, over the in-process channel pair and over loopback WebSocket.
// Argument: approximate size in bytes of the body as JSON text. A body is a list of small objects,
// as model documents are, so encoding and parsing weigh as they would in use.
#include "qf/zero/io/in_process_channel.h"
#include "qf/zero/io/packet_transport.h"
#include "qf/zero/io/websocket_channel.h"

#include <benchmark/benchmark.h>

#include <future>
#include <memory>
#include <stdexcept>
#include <string>
#include <utility>

namespace {

namespace io = qf::zero::io;
using Json = nlohmann::ordered_json;

struct Peers {
  std::unique_ptr<io::PacketTransport> client;
  std::unique_ptr<io::PacketTransport> server;
};

Peers inProcess() {
  auto [a, b] = io::InProcessChannel::createPair();
  return {std::make_unique<io::PacketTransport>(a), std::make_unique<io::PacketTransport>(b)};
}

Peers webSocket() {
  std::promise<std::shared_ptr<io::SynchronizationChannel>> accepted;
  io::WebSocketListener listener("127.0.0.1", 0,
                                 [&accepted](auto channel) { accepted.set_value(std::move(channel)); });
  auto client = io::WebSocketChannel::connect("127.0.0.1", listener.getPort());
  auto server = accepted.get_future().get();
  return {std::make_unique<io::PacketTransport>(client), std::make_unique<io::PacketTransport>(server)};
}

Json bodyOfAbout(std::size_t bytes) {
  Json items = Json::array();
  std::size_t size = 2;
  for (int i = 0; size < bytes; ++i) {
    Json item = {{"id", "e" + std::to_string(i)}, {"name", "element " + std::to_string(i)}, {"count", i}};
    size += item.dump().size() + 1;
    items.push_back(std::move(item));
  }
  return items;
}

void roundTrip(benchmark::State& state, Peers (*connect)()) {
  Peers peers = connect();
  peers.server->setPacketHandler("Echo", [](const io::JSONPacket& request) {
    return boost::optional<io::JSONPacket>(io::JSONPacket("OK", request.getJson()));
  });
  const io::JSONPacket request("Echo", bodyOfAbout(static_cast<std::size_t>(state.range(0))));
  const auto bytes = static_cast<std::int64_t>(request.getJson().dump().size());
  for (auto _ : state) {
    auto reply = peers.client->sendAndExpectPacket(request, "OK");
    if (reply.getType() != "OK") throw std::runtime_error("unexpected reply " + reply.getType());
    benchmark::DoNotOptimize(reply);
  }
  state.SetBytesProcessed(state.iterations() * bytes * 2);
}

BENCHMARK_CAPTURE(roundTrip, InProcess, &inProcess)->Arg(64)->Arg(100 * 1024)->UseRealTime();
BENCHMARK_CAPTURE(roundTrip, WebSocket, &webSocket)->Arg(64)->Arg(100 * 1024)->UseRealTime();

}  // namespace
