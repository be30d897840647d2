#pragma once

#include "qf/zero/io/synchronization_channel.h"

#include <cstddef>
#include <memory>
#include <string>
#include <utility>

namespace qf::zero::io {

// One end of a pair of channels connected inside this process, for tests and for running both
// peers in one program. It behaves as a socket would: each end delivers on its own thread,
// messages sent before the peer closed still reach it, and closing one end closes the other
// (whose onClosed fires with "closed by the peer"). Local close() drops what was not yet
// delivered to this end.
class InProcessChannel final : public SynchronizationChannel {
 public:
  using Pair = std::pair<std::shared_ptr<SynchronizationChannel>, std::shared_ptr<SynchronizationChannel>>;

  static Pair createPair();

  ~InProcessChannel() override;

  void start(MessageHandler onMessage, ClosedHandler onClosed) override;
  void send(std::string message) override;
  void close() override;
  bool isOpen() const override;
  std::size_t maxMessageSize() const override;
  void setMaxMessageSize(std::size_t bytes) override;

 private:
  struct Link;  // shared by both ends and their threads
  struct End;   // one end's side of the link and its receiving thread

  explicit InProcessChannel(std::shared_ptr<End> end);

  std::shared_ptr<End> end_;
};

}  // namespace qf::zero::io
