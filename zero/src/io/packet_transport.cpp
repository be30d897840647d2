#include "qf/zero/io/packet_transport.h"

#include "foundation/core/except/exception.h"
#include "io/owned_thread.h"
#include "qf/zero/core/messages.h"
#include "qf/zero/core/report_exception.h"
#include "qf/zero/io/packet_codec.h"

#include <atomic>
#include <condition_variable>
#include <cstdint>
#include <deque>
#include <exception>
#include <mutex>
#include <optional>
#include <thread>
#include <type_traits>
#include <unordered_map>
#include <utility>

namespace qf::zero::io {

namespace {

namespace except = foundation::core::except;
using Json = nlohmann::ordered_json;

// Error texts come from anywhere (a handler's what(), a peer's bytes); the codec refuses text
// that is not UTF-8, so replace what is not.
std::string validUtf8(const std::string& text) {
  return Json::parse(Json(text).dump(-1, ' ', false, Json::error_handler_t::replace)).get<std::string>();
}

Json errorBody(const std::string& message) { return Json{{"message", validUtf8(message)}}; }

Json errorBody(const except::ExceptionBase& error) {
  Json body = errorBody(error.message());
  body["messageId"] = error.GetID();
  return body;
}

template <class M>
requires std::is_base_of_v<except::Message, M> Json errorBody(M message) {
  return errorBody(except::Exception<M>(std::move(message)));
}

// The body of the "Error" reply for the exception being handled, whatever was thrown: a
// catalog message as it is, anything else as PacketHandlerFailed. REQUIRES: inside a catch.
Json caughtErrorBody(const std::string& packetType) {
  try {
    throw;
  } catch (const except::ExceptionBase& error) {
    return errorBody(error);
  } catch (const std::exception& error) {
    return errorBody(qf0::messages::PacketHandlerFailed(packetType, error.what()));
  } catch (...) {
    return errorBody(qf0::messages::PacketHandlerFailed(
        packetType, "the handler threw an object that is not a std::exception"));
  }
}

// The why of a ChannelClosed raised by the channel.
std::string closedReason(const except::Exception<qf0::messages::ChannelClosed>& error) {
  const auto& arguments = error.getMessage().id().arguments();
  return arguments.empty() ? std::string("the channel is closed") : except::argumentText(arguments.front());
}

}  // namespace

class PacketTransport::Impl : public std::enable_shared_from_this<Impl> {
 public:
  explicit Impl(std::shared_ptr<SynchronizationChannel> channel) : channel_(std::move(channel)) {
    if (!channel_) reportException(qf0::messages::CannotCreateTransportWithoutChannel());
  }

  // Callbacks hold the transport weakly: the channel may outlive it.
  void start() {
    std::weak_ptr<Impl> weak = weak_from_this();
    channel_->start(
        [weak](std::string message) {
          if (auto self = weak.lock()) self->receive(message);
        },
        [weak](const std::string& reason) {
          if (auto self = weak.lock()) self->shutDown(reason);
        });
  }

  void sendPacket(const JSONPacket& packet) { channel_->send(PacketCodec::encode(packet, nextId_++)); }

  JSONPacket exchange(const JSONPacket& request, const std::string& expectedType,
                      std::optional<std::chrono::milliseconds> timeout) {
    if (receivingThread_.load() == std::this_thread::get_id())
      reportException(qf0::messages::ExchangeFailed(
          expectedType,
          "a reply cannot arrive while its handler holds up the receiving thread; "
          "set the handler with PacketPromiseMode::OnWorkerThread"));
    const std::uint64_t id = nextId_++;
    std::string text = PacketCodec::encode(request, id);
    auto exchange = std::make_shared<Exchange>();
    {
      std::lock_guard lock(mutex_);
      if (closed_) reportException(qf0::messages::ExchangeFailed(expectedType, closeReason_));
      pending_.emplace(id, exchange);
    }
    try {
      channel_->send(std::move(text));
    } catch (const except::Exception<qf0::messages::ChannelClosed>& error) {
      forget(id);
      reportException(qf0::messages::ExchangeFailed(expectedType, closedReason(error)));
    } catch (...) {
      forget(id);
      throw;
    }

    std::unique_lock lock(mutex_);
    const auto answered = [&] { return exchange->reply || exchange->failed; };
    if (!timeout) {
      exchange->answered.wait(lock, answered);
    } else if (!exchange->answered.wait_for(lock, *timeout, answered)) {
      pending_.erase(id);
      reportException(qf0::messages::ExchangeFailed(
          expectedType, "no reply within " + std::to_string(timeout->count()) + " ms"));
    }
    if (exchange->failed) reportException(qf0::messages::ExchangeFailed(expectedType, exchange->why));
    return std::move(*exchange->reply);
  }

  void setHandler(std::string type, PacketHandler handler, PacketPromiseMode mode) {
    auto entry = std::make_shared<const Handler>(Handler{std::move(handler), mode});
    std::lock_guard lock(mutex_);
    handlers_[std::move(type)] = std::move(entry);
  }

  void close() {
    shutDown("closed locally");
    channel_->close();
    worker_.join();
  }

  bool isOpen() const {
    std::lock_guard lock(mutex_);
    return !closed_;
  }

 private:
  struct Exchange {
    std::condition_variable answered;
    std::optional<JSONPacket> reply;
    bool failed = false;
    std::string why;
  };

  struct Handler {
    PacketHandler run;
    PacketPromiseMode mode;
  };

  struct Work {
    std::shared_ptr<const Handler> handler;
    JSONPacket packet;
    std::uint64_t id;
  };

  // On the receiving thread.
  void receive(const std::string& text) {
    receivingThread_ = std::this_thread::get_id();
    std::optional<PacketEnvelope> envelope;
    try {
      envelope.emplace(PacketCodec::decode(text));
    } catch (const except::ExceptionBase& error) {
      send(JSONPacket(errorPacketType, errorBody(error)), std::nullopt);
      return;
    } catch (const std::exception& error) {  // out of memory for a huge text, say
      send(JSONPacket(errorPacketType, errorBody(qf0::messages::MalformedPacket(error.what()))),
           std::nullopt);
      return;
    }
    if (envelope->replyTo) {
      resolve(*envelope->replyTo, std::move(envelope->packet));
      return;
    }

    std::shared_ptr<const Handler> handler;
    {
      std::lock_guard lock(mutex_);
      if (const auto it = handlers_.find(envelope->packet.getType()); it != handlers_.end())
        handler = it->second;
    }
    if (!handler) {
      if (envelope->packet.getType() != errorPacketType) {
        send(JSONPacket(errorPacketType,
                        errorBody(qf0::messages::UnknownPacketType(envelope->packet.getType()))),
             envelope->id);
      }
      return;
    }
    if (handler->mode == PacketPromiseMode::OnReceivingThread) {
      handle(*handler, envelope->packet, envelope->id);
      return;
    }
    {
      std::lock_guard lock(mutex_);
      if (closed_) return;
      work_.push_back(Work{std::move(handler), std::move(envelope->packet), envelope->id});
      if (!workerLaunched_) {
        workerLaunched_ = true;
        worker_.launch([self = shared_from_this()] { self->work(); });
      }
    }
    workArrived_.notify_one();
  }

  void resolve(std::uint64_t replyTo, JSONPacket reply) {
    std::lock_guard lock(mutex_);
    const auto it = pending_.find(replyTo);
    if (it == pending_.end()) return;  // nobody waits for it (any more)
    it->second->reply.emplace(std::move(reply));
    it->second->answered.notify_one();
    pending_.erase(it);
  }

  void forget(std::uint64_t id) {
    std::lock_guard lock(mutex_);
    pending_.erase(id);
  }

  // The worker thread: runs queued requests in arrival order until the transport closes.
  void work() {
    for (;;) {
      std::optional<Work> next;
      {
        std::unique_lock lock(mutex_);
        workArrived_.wait(lock, [this] { return !work_.empty() || closed_; });
        if (closed_) return;
        next.emplace(std::move(work_.front()));
        work_.pop_front();
      }
      handle(*next->handler, next->packet, next->id);
    }
  }

  void handle(const Handler& handler, const JSONPacket& request, std::uint64_t id) {
    boost::optional<JSONPacket> reply;
    try {
      reply = handler.run(request);
    } catch (...) {
      send(JSONPacket(errorPacketType, caughtErrorBody(request.getType())), id);
      return;
    }
    if (reply) send(*reply, id);
  }

  // Sends a packet of our own making. Failures have nobody to go to: a closed channel means
  // the peer is gone; a reply that cannot be sent (too large, not UTF-8; an "Error" reply a
  // handler made included) is replaced once by an Error reply saying why, so the requester does
  // not wait in vain. errorBody makes that one always encodable.
  void send(const JSONPacket& packet, std::optional<std::uint64_t> replyTo, bool isReplacement = false) {
    try {
      channel_->send(PacketCodec::encode(packet, nextId_++, replyTo));
    } catch (const except::Exception<qf0::messages::ChannelClosed>&) {
    } catch (const except::ExceptionBase& error) {
      if (!isReplacement) send(JSONPacket(errorPacketType, errorBody(error)), replyTo, true);
    } catch (const std::exception&) {
    }
  }

  // The transport is over: fail the exchanges in flight and stop the worker. Idempotent.
  void shutDown(const std::string& reason) {
    {
      std::lock_guard lock(mutex_);
      if (closed_) return;
      closed_ = true;
      closeReason_ = reason;
      for (auto& [id, exchange] : pending_) {
        exchange->failed = true;
        exchange->why = reason;
        exchange->answered.notify_one();
      }
      pending_.clear();
      work_.clear();
    }
    workArrived_.notify_all();
  }

  const std::shared_ptr<SynchronizationChannel> channel_;
  std::atomic<std::uint64_t> nextId_{1};
  std::atomic<std::thread::id> receivingThread_{};

  mutable std::mutex mutex_;  // guards everything below
  bool closed_ = false;
  std::string closeReason_;
  std::unordered_map<std::uint64_t, std::shared_ptr<Exchange>> pending_;
  std::unordered_map<std::string, std::shared_ptr<const Handler>> handlers_;
  std::deque<Work> work_;
  std::condition_variable workArrived_;
  bool workerLaunched_ = false;
  OwnedThread worker_;
};

PacketTransport::PacketTransport(std::shared_ptr<SynchronizationChannel> channel)
    : impl_(std::make_shared<Impl>(std::move(channel))) {
  impl_->start();
}

PacketTransport::~PacketTransport() { impl_->close(); }

void PacketTransport::sendPacket(const JSONPacket& packet) { impl_->sendPacket(packet); }

JSONPacket PacketTransport::sendAndExpectPacket(const JSONPacket& request, const std::string& expectedType) {
  return impl_->exchange(request, expectedType, std::nullopt);
}

JSONPacket PacketTransport::sendAndExpectPacket(const JSONPacket& request, const std::string& expectedType,
                                                std::chrono::milliseconds timeout) {
  return impl_->exchange(request, expectedType, timeout);
}

void PacketTransport::setPacketHandler(std::string type, PacketHandler handler, PacketPromiseMode mode) {
  impl_->setHandler(std::move(type), std::move(handler), mode);
}

void PacketTransport::close() { impl_->close(); }

bool PacketTransport::isOpen() const { return impl_->isOpen(); }

}  // namespace qf::zero::io
