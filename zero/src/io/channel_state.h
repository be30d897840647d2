#pragma once

#include "qf/zero/io/synchronization_channel.h"

#include <atomic>
#include <cstddef>
#include <mutex>
#include <string>

namespace qf::zero::io {

// What every SynchronizationChannel implementation keeps the same way: open or closed and why,
// the size limit, the handlers given to start() and the rule that onClosed runs once, last.
// Implementations keep it in the state their receiving thread shares, never in the public object,
// since that thread may outlive the object.
//
// Threads: deliverMessage is called by the receiving thread only; deliverClosed by the receiving
// thread, or by start() once that thread has ended. Everything else from any thread.
class ChannelState {
 public:
  bool isOpen() const noexcept { return open_.load(); }

  // Marks the channel closed. The first reason given is the one kept. Returns whether this call
  // was the one that closed it.
  bool markClosed(const std::string& reason);
  std::string reason() const;

  std::size_t maxMessageSize() const noexcept { return maxMessageSize_.load(); }
  void setMaxMessageSize(std::size_t bytes) noexcept { maxMessageSize_ = bytes; }

  // Raises ChannelClosed with the reason when closed, PacketTooLarge when size is over the limit.
  void checkCanSend(std::size_t size) const;

  // Stores the handlers. Raises ChannelAlreadyStarted when called twice.
  void start(SynchronizationChannel::MessageHandler onMessage,
             SynchronizationChannel::ClosedHandler onClosed);

  bool started() const;

  // Passes one message to onMessage. REQUIRES: start() happened before on this thread's view.
  void deliverMessage(std::string message);

  // Calls onClosed(reason()) unless not started or already called, then drops both handlers (they
  // may hold what owns this channel).
  void deliverClosed();

 private:
  std::atomic<bool> open_{true};
  std::atomic<std::size_t> maxMessageSize_{SynchronizationChannel::defaultMaxMessageSize};

  mutable std::mutex mutex_;
  std::string reason_;
  bool started_ = false;
  bool closedDelivered_ = false;
  SynchronizationChannel::MessageHandler onMessage_;
  SynchronizationChannel::ClosedHandler onClosed_;
};

// The reason a channel gives when an incoming message is over its limit.
std::string tooLargeReason(std::size_t limit);

}  // namespace qf::zero::io
