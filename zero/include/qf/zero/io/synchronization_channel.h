#pragma once

#include <cstddef>
#include <functional>
#include <string>

namespace qf::zero::io {

// A connection to one peer that carries whole text messages, each delivered as sent (no
// splitting or merging), in order. A PacketTransport runs over one; implementations are the
// in-process pair (InProcessChannel) and WebSocket (WebSocketChannel).
//
// Threads: each channel has its own receiving thread. Both callbacks given to start() run on it,
// one at a time, onClosed last. Every other member may be called from any thread, including from
// inside those callbacks. Exceptions thrown by a callback are dropped: the receiving thread has
// nobody to report them to.
//
// Shared ownership: whoever holds the last reference destroys the channel, which closes it. That
// may happen inside one of its own callbacks; the receiving thread then finishes on its own.
class SynchronizationChannel {
 public:
  using MessageHandler = std::function<void(std::string message)>;
  using ClosedHandler = std::function<void(const std::string& reason)>;

  static constexpr std::size_t defaultMaxMessageSize = std::size_t{16} * 1024 * 1024;

  virtual ~SynchronizationChannel() = default;
  SynchronizationChannel(const SynchronizationChannel&) = delete;
  SynchronizationChannel& operator=(const SynchronizationChannel&) = delete;

  // Begins delivering received messages to onMessage. Messages that arrived earlier were held
  // and come first. onClosed(reason) is called exactly once, after the last onMessage, when
  // either side closes or the connection fails; the reason says which, for people to read. When
  // the channel had already closed and its thread ended, onClosed runs at once on the calling
  // thread. Nothing is delivered to anyone before start().
  // REQUIRES: called once; both handlers callable. A second call raises ChannelAlreadyStarted.
  virtual void start(MessageHandler onMessage, ClosedHandler onClosed) = 0;

  // Queues one message for the peer and returns without waiting for it to leave. Raises
  // ChannelClosed once the channel is closed, and PacketTooLarge (sending nothing) for a
  // message longer than maxMessageSize(). A message queued just as the connection fails may be
  // lost without an error: the peer can only be known to have it when it answers.
  virtual void send(std::string message) = 0;

  // Closes the connection; messages already queued by send() still go out first, as far as the
  // peer accepts them within a few seconds. Idempotent. From any thread but the receiving one it
  // returns after the receiving thread has ended, so onClosed has run (if started) and no
  // callback runs any more. From inside a callback it returns at once; onClosed follows after
  // the callback returns.
  virtual void close() = 0;

  // False from the moment either side closes or the connection fails.
  virtual bool isOpen() const = 0;

  // Longest message accepted, in bytes, in either direction. A longer incoming message closes
  // the connection with a reason starting "PacketTooLarge". Setting it applies from the next
  // message received.
  virtual std::size_t maxMessageSize() const = 0;
  virtual void setMaxMessageSize(std::size_t bytes) = 0;

 protected:
  SynchronizationChannel() = default;
};

}  // namespace qf::zero::io
