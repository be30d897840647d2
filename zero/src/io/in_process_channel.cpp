#include "qf/zero/io/in_process_channel.h"

#include "io/channel_state.h"
#include "io/owned_thread.h"

#include <array>
#include <condition_variable>
#include <deque>
#include <mutex>
#include <utility>

namespace qf::zero::io {

struct InProcessChannel::Link {
  std::mutex mutex;  // guards the members below; never held while calling out
  std::array<std::condition_variable, 2> arrived;
  std::array<std::deque<std::string>, 2> inbox;  // inbox[s]: sent to side s, not yet delivered
  std::array<bool, 2> dropInbox{false, false};   // side s stops delivering at once
  bool closed = false;
  std::array<ChannelState, 2> state;

  // Closes both sides; the side that closes keeps `reason`, the other hears `peerReason`.
  void close(int side, const std::string& reason, const std::string& peerReason) {
    {
      std::lock_guard lock(mutex);
      if (closed) return;
      closed = true;
      dropInbox[side] = true;
      state[side].markClosed(reason);
      state[1 - side].markClosed(peerReason);
    }
    arrived[0].notify_all();
    arrived[1].notify_all();
  }
};

struct InProcessChannel::End {
  std::shared_ptr<Link> link;
  int side = 0;
  OwnedThread thread;

  ChannelState& state() const { return link->state[side]; }

  // The receiving thread: delivers until the inbox is drained after a peer close, or at once
  // after a local one.
  void run() {
    for (;;) {
      std::string message;
      {
        std::unique_lock lock(link->mutex);
        link->arrived[side].wait(lock, [&] { return !link->inbox[side].empty() || link->closed; });
        if (link->dropInbox[side] || link->inbox[side].empty()) break;
        message = std::move(link->inbox[side].front());
        link->inbox[side].pop_front();
      }
      const std::size_t limit = state().maxMessageSize();
      if (message.size() > limit) {
        const std::string reason = tooLargeReason(limit);
        link->close(side, reason, "closed by the peer: " + reason);
        continue;
      }
      state().deliverMessage(std::move(message));
    }
    state().deliverClosed();
  }
};

InProcessChannel::Pair InProcessChannel::createPair() {
  auto link = std::make_shared<Link>();
  auto first = std::make_shared<End>();
  first->link = link;
  first->side = 0;
  auto second = std::make_shared<End>();
  second->link = link;
  second->side = 1;
  return {std::shared_ptr<InProcessChannel>(new InProcessChannel(std::move(first))),
          std::shared_ptr<InProcessChannel>(new InProcessChannel(std::move(second)))};
}

InProcessChannel::InProcessChannel(std::shared_ptr<End> end) : end_(std::move(end)) {}

InProcessChannel::~InProcessChannel() { close(); }

void InProcessChannel::start(MessageHandler onMessage, ClosedHandler onClosed) {
  end_->state().start(std::move(onMessage), std::move(onClosed));
  end_->thread.launch([end = end_] { end->run(); });
}

void InProcessChannel::send(std::string message) {
  Link& link = *end_->link;
  const int peer = 1 - end_->side;
  end_->state().checkCanSend(message.size());
  {
    std::lock_guard lock(link.mutex);
    // Closed since the check above: the message would never be delivered.
    if (link.closed) end_->state().checkCanSend(0);
    link.inbox[peer].push_back(std::move(message));
  }
  link.arrived[peer].notify_one();
}

void InProcessChannel::close() {
  end_->link->close(end_->side, "closed locally", "closed by the peer");
  end_->thread.join();
}

bool InProcessChannel::isOpen() const { return end_->state().isOpen(); }

std::size_t InProcessChannel::maxMessageSize() const { return end_->state().maxMessageSize(); }

void InProcessChannel::setMaxMessageSize(std::size_t bytes) { end_->state().setMaxMessageSize(bytes); }

}  // namespace qf::zero::io
