#include "io/channel_state.h"

#include "qf/zero/core/messages.h"
#include "qf/zero/core/report_exception.h"

#include <utility>

namespace qf::zero::io {

bool ChannelState::markClosed(const std::string& reason) {
  std::lock_guard lock(mutex_);
  if (!open_.load()) return false;
  reason_ = reason;
  open_ = false;
  return true;
}

std::string ChannelState::reason() const {
  std::lock_guard lock(mutex_);
  return reason_;
}

void ChannelState::checkCanSend(std::size_t size) const {
  if (!isOpen()) reportException(qf0::messages::ChannelClosed(reason()));
  if (size > maxMessageSize()) reportException(qf0::messages::PacketTooLarge(size, maxMessageSize()));
}

void ChannelState::start(SynchronizationChannel::MessageHandler onMessage,
                         SynchronizationChannel::ClosedHandler onClosed) {
  std::lock_guard lock(mutex_);
  if (started_) reportException(qf0::messages::ChannelAlreadyStarted());
  onMessage_ = std::move(onMessage);
  onClosed_ = std::move(onClosed);
  started_ = true;
}

bool ChannelState::started() const {
  std::lock_guard lock(mutex_);
  return started_;
}

void ChannelState::deliverMessage(std::string message) {
  // onMessage_ is only replaced by deliverClosed, on this same thread.
  try {
    onMessage_(std::move(message));
  } catch (...) {
    // Contract: exceptions from callbacks are dropped.
  }
}

void ChannelState::deliverClosed() {
  SynchronizationChannel::ClosedHandler onClosed;
  std::string reason;
  {
    std::lock_guard lock(mutex_);
    if (!started_ || closedDelivered_) return;
    closedDelivered_ = true;
    onClosed = std::move(onClosed_);
    onClosed_ = nullptr;
    reason = reason_;
  }
  onMessage_ = nullptr;
  try {
    onClosed(reason);
  } catch (...) {
    // Contract: exceptions from callbacks are dropped.
  }
}

std::string tooLargeReason(std::size_t limit) {
  return "PacketTooLarge: an incoming message exceeds the limit of " + std::to_string(limit) + " bytes";
}

}  // namespace qf::zero::io
