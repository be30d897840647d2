#pragma once

#include "qf/zero/io/json_packet.h"
#include "qf/zero/io/synchronization_channel.h"

#include <boost/optional.hpp>

#include <chrono>
#include <functional>
#include <memory>
#include <string>

namespace qf::zero::io {

// Where a packet handler runs.
enum class PacketPromiseMode {
  // On the channel's receiving thread: cheapest, but the handler holds up every packet behind
  // it, replies included. So such a handler cannot wait for a reply: the reply could only
  // arrive on the thread it blocks. sendAndExpectPacket called there raises ExchangeFailed at
  // once rather than wait forever.
  OnReceivingThread,
  // On the transport's worker thread, one packet at a time in arrival order. The handler may
  // call sendAndExpectPacket on this same transport: replies keep arriving meanwhile.
  OnWorkerThread,
};

// Request/reply exchanges of JSONPackets over a SynchronizationChannel (see PacketCodec for the
// wire form). Every packet sent gets a fresh id; a reply names the id of its request, so several
// threads may have exchanges in flight at once and each gets its own reply.
//
// Incoming packets that are not replies go to the handler registered for their type. Faults are
// answered, never fatal:
//  - a handler that throws, whatever it throws: an "Error" reply, body {"message": <text>,
//    "messageId": "catalog/key"} of the catalog message it raised, or else of
//    PacketHandlerFailed (quoting what() of a std::exception);
//  - a reply that cannot be encoded (not UTF-8, too large): an "Error" reply saying why;
//  - a type without a handler: an "Error" reply whose body names UnknownPacketType. Packets of
//    type "Error" without a handler are dropped instead, so two transports never trade errors;
//  - a text that is not a packet: an "Error" packet without "replyTo" naming MalformedPacket.
//    The channel keeps messages apart, so the transport carries on with the next one;
//  - a reply that matches no exchange in flight (e.g. one that timed out): dropped.
//
// Threads: every member may be called from any thread, handlers included, except as noted for
// OnReceivingThread handlers. The transport shares ownership of the channel; destroying the
// transport closes it.
class PacketTransport {
 public:
  using PacketHandler = std::function<boost::optional<JSONPacket>(const JSONPacket& packet)>;

  static constexpr const char* errorPacketType = "Error";

  // Starts the channel. Raises CannotCreateTransportWithoutChannel for a null channel.
  // REQUIRES: channel not started.
  explicit PacketTransport(std::shared_ptr<SynchronizationChannel> channel);

  // close(), then releases the channel.
  ~PacketTransport();

  PacketTransport(const PacketTransport&) = delete;
  PacketTransport& operator=(const PacketTransport&) = delete;

  // Sends without waiting for anything. Raises ChannelClosed once closed, PacketTooLarge when
  // over the channel's limit, MalformedPacket when the packet holds text that is not UTF-8.
  void sendPacket(const JSONPacket& packet);

  // Sends request and blocks until its reply arrives, which is returned whatever its type: the
  // caller compares it with what it expected (an "Error" reply reports a failure on the peer).
  // expectedType only names the awaited reply in errors. Raises ExchangeFailed when the channel
  // closes, or is closed, before the reply arrives, or when called on the receiving thread (from
  // an OnReceivingThread handler), and PacketTooLarge or MalformedPacket as
  // sendPacket does (nothing was sent then). Without a timeout it waits as long as the
  // connection lasts; with one, it raises ExchangeFailed once the timeout has passed.
  JSONPacket sendAndExpectPacket(const JSONPacket& request, const std::string& expectedType);
  JSONPacket sendAndExpectPacket(const JSONPacket& request, const std::string& expectedType,
                                 std::chrono::milliseconds timeout);

  // Runs handler for each incoming request of this type, in the given mode; a returned packet is
  // sent back as the reply, none sends nothing (for packets sent with sendPacket). Replaces the
  // handler of that type, if any, from the next packet on.
  void setPacketHandler(std::string type, PacketHandler handler,
                        PacketPromiseMode mode = PacketPromiseMode::OnReceivingThread);

  // Closes the channel, fails exchanges in flight with ExchangeFailed, drops packets still
  // queued for the worker and waits for the worker thread (unless called from a handler).
  // Idempotent.
  void close();

  bool isOpen() const;

 private:
  class Impl;  // shared with the channel's callbacks and the worker thread
  std::shared_ptr<Impl> impl_;
};

}  // namespace qf::zero::io
