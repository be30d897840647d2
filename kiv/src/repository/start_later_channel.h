// A channel held back until its transport's handlers are in place.
#pragma once

#include "qf/zero/io/synchronization_channel.h"

#include <memory>
#include <string>
#include <utility>

namespace kiv {

// Holds a channel back until the handlers are in place: the transport starts its channel
// as it is made, and a request that arrived before its handler would be refused as of an
// unknown type.
class StartLaterChannel final : public qf::zero::io::SynchronizationChannel {
 public:
  explicit StartLaterChannel(std::shared_ptr<SynchronizationChannel> channel)
      : channel_(std::move(channel)) {}

  void start(MessageHandler onMessage, ClosedHandler onClosed) override {
    onMessage_ = std::move(onMessage);
    onClosed_ = std::move(onClosed);
  }
  // Starts the channel with the handlers the transport gave.
  void open() { channel_->start(std::move(onMessage_), std::move(onClosed_)); }

  void send(std::string message) override { channel_->send(std::move(message)); }
  void close() override { channel_->close(); }
  bool isOpen() const override { return channel_->isOpen(); }
  std::size_t maxMessageSize() const override { return channel_->maxMessageSize(); }
  void setMaxMessageSize(std::size_t bytes) override { channel_->setMaxMessageSize(bytes); }

 private:
  std::shared_ptr<SynchronizationChannel> channel_;
  MessageHandler onMessage_;
  ClosedHandler onClosed_;
};

}  // namespace kiv
