#pragma once

#include "qf/zero/io/synchronization_channel.h"

#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <string>

namespace qf::zero::io {

// The connection behind a WebSocketChannel, with its own I/O thread; defined in the source so
// that no header pulls in the networking library.
class WebSocketConnection;

// A SynchronizationChannel over a WebSocket connection (TCP, no TLS). Each message is one text
// frame, so any WebSocket peer, a browser included, can take part. The receiving thread is the
// connection's I/O thread: a callback that blocks it also stops this end from answering pings,
// and a peer that hears nothing for a minute gives up on the connection.
//
// close() performs the closing handshake, waiting at most a few seconds for the peer. A peer
// that disappears without one (process killed, connection reset) closes this end with a reason
// starting "connection lost".
class WebSocketChannel final : public SynchronizationChannel {
 public:
  // Connects to ws://host:port<target> and completes the opening handshake, waiting at most
  // ten seconds. Raises ConnectionFailed naming the endpoint and the cause.
  // REQUIRES: target starts with '/'.
  static std::shared_ptr<SynchronizationChannel> connect(const std::string& host, std::uint16_t port,
                                                         const std::string& target = "/");

  // Bytes that may wait to be sent, given the channel's maxMessageSize(): twice that, and at
  // least 8 MiB so that a burst of small messages to a peer that reads is never cut. A send
  // that would pass the limit (the peer leaves what it is sent unread) closes the channel
  // with a reason starting "connection dropped" and raises ChannelClosed.
  static std::size_t unsentLimit(std::size_t maxMessageSize) noexcept;

  // Made by connect() and WebSocketListener only: nothing else can make a connection.
  explicit WebSocketChannel(std::shared_ptr<WebSocketConnection> connection);
  ~WebSocketChannel() override;

  void start(MessageHandler onMessage, ClosedHandler onClosed) override;
  void send(std::string message) override;
  void close() override;
  bool isOpen() const override;
  std::size_t maxMessageSize() const override;
  void setMaxMessageSize(std::size_t bytes) override;

 private:
  std::shared_ptr<WebSocketConnection> connection_;
};

// Accepts WebSocket connections on one TCP address and hands each to onAccept, after its opening
// handshake, as a channel that is not started yet: onAccept (or whoever it passes the channel
// to) calls start(). A peer that fails the handshake within ten seconds is dropped unseen, and
// so is one for which no thread can be started; accepting goes on.
//
// Threads: the listener has its own thread; onAccept runs there, one call at a time. An exception
// from onAccept is dropped along with the channel. Destroying or closing the listener stops
// accepting and drops peers still in their handshake; channels already handed over stay open.
class WebSocketListener {
 public:
  // Peers in their opening handshake at once; each holds a thread until it completes, fails or
  // times out (ten seconds). A peer that connects past the limit is closed unseen.
  static constexpr std::size_t maxPendingHandshakes = 64;

  using AcceptHandler = std::function<void(std::shared_ptr<SynchronizationChannel> channel)>;

  // Listens on address ("127.0.0.1", "::", "localhost", ...) and port; port 0 picks a free one
  // (see getPort()). Raises ListenFailed when the address cannot be listened on.
  // With a `requiredTarget` (e.g. "/" followed by a shared token), a peer whose opening
  // request asks for any other target is answered "403 Forbidden" and dropped unseen; the
  // comparison takes the same time wherever the texts differ.
  WebSocketListener(const std::string& address, std::uint16_t port, AcceptHandler onAccept,
                    std::string requiredTarget = "");
  ~WebSocketListener();
  WebSocketListener(const WebSocketListener&) = delete;
  WebSocketListener& operator=(const WebSocketListener&) = delete;

  // The port actually listened on.
  std::uint16_t getPort() const noexcept;

  // Stops accepting. Idempotent; from any thread but inside onAccept it returns after the
  // listener's thread has ended.
  void close();

 private:
  class Acceptor;  // the socket and thread, shared with that thread; defined in the source
  std::shared_ptr<Acceptor> acceptor_;
};

}  // namespace qf::zero::io
