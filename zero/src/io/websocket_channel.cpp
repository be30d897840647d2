// ThreadSanitizer does not model the standalone fences Asio places around handler calls (GCC
// warns with -Wtsan). They are redundant here: handlers cross threads only through the
// io_context's mutex-guarded queues, which order memory on their own. This is the only file that
// includes Asio, so the choice cannot differ between translation units.
#if defined(__SANITIZE_THREAD__)
#define BOOST_ASIO_DISABLE_FENCED_BLOCK
#elif defined(__has_feature)
#if __has_feature(thread_sanitizer)
#define BOOST_ASIO_DISABLE_FENCED_BLOCK
#endif
#endif

#include "qf/zero/io/websocket_channel.h"

#include "io/channel_state.h"
#include "io/owned_thread.h"
#include "qf/zero/core/messages.h"
#include "qf/zero/core/report_exception.h"

#include <boost/asio/executor_work_guard.hpp>
#include <boost/asio/io_context.hpp>
#include <boost/asio/ip/tcp.hpp>
#include <boost/asio/post.hpp>
#include <boost/asio/steady_timer.hpp>
#include <boost/beast/core.hpp>
#include <boost/beast/http.hpp>
#include <boost/beast/websocket.hpp>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <deque>
#include <limits>
#include <mutex>
#include <optional>
#include <utility>
#include <vector>

namespace qf::zero::io {

namespace {

namespace asio = boost::asio;
namespace beast = boost::beast;
namespace websocket = boost::beast::websocket;
namespace http = boost::beast::http;
using tcp = boost::asio::ip::tcp;

// Opening handshake, TCP connect included.
constexpr auto openTimeout = std::chrono::seconds(10);
// Silence after which the peer is pinged, and after twice as long given up on.
constexpr auto idleTimeout = std::chrono::seconds(60);
// How long a local close waits for the peer's closing handshake before dropping the connection.
constexpr auto closeTimeout = std::chrono::seconds(5);
// Pause before accepting again after accept() failed, e.g. for lack of file descriptors.
constexpr auto acceptRetryDelay = std::chrono::milliseconds(100);
// The reason a connection gives when it drops a peer that leaves what it is sent unread.
constexpr const char* notReadingReason = "connection dropped: the peer does not read what it is sent";

void runUntilStopped(asio::io_context& io) {
  for (;;) {
    try {
      io.run();
      return;
    } catch (...) {
      // No handler of ours throws; should one still, the connection must keep being served.
    }
  }
}

}  // namespace

// One WebSocket connection and the thread running its I/O, which is also the receiving thread.
// All members without a note run on that thread; the public ones (start, send, requestClose,
// close) may be called from any thread and only post work to it. The thread holds a shared_ptr
// to the connection, so the connection outlives any public object closed from its own callback.
class WebSocketConnection : public std::enable_shared_from_this<WebSocketConnection> {
 public:
  using HandshakeDone = std::function<void(const std::shared_ptr<WebSocketConnection>&)>;

  asio::io_context& context() { return io_; }
  ChannelState& state() { return state_; }

  // Client side, on the caller's thread: resolves, connects and completes the opening handshake,
  // then launches the I/O thread. Raises ConnectionFailed.
  void connect(const std::string& host, std::uint16_t port, const std::string& target) {
    const std::string endpoint = host + ":" + std::to_string(port);
    if (target.empty() || target.front() != '/')
      reportException(
          qf0::messages::ConnectionFailed(endpoint, "the target \"" + target + "\" does not start with '/'"));
    ws_.emplace(io_);
    tcp::resolver resolver(io_);
    beast::error_code failure;
    bool connected = false;
    const auto resolved = [&](beast::error_code ec, tcp::resolver::results_type results) {
      if (ec) {
        failure = ec;
        return;
      }
      beast::get_lowest_layer(*ws_).expires_after(openTimeout);
      beast::get_lowest_layer(*ws_).async_connect(results, [&](beast::error_code ec, const tcp::endpoint&) {
        if (ec) {
          failure = ec;
          return;
        }
        // From here the WebSocket layer keeps the time; both must not be armed at once.
        beast::get_lowest_layer(*ws_).expires_never();
        configure();
        ws_->async_handshake(endpoint, target, [&](beast::error_code ec) {
          failure = ec;
          connected = !ec;
          // A declined upgrade leaves the WebSocket layer's open timer armed, and the caller
          // would wait it out: the refusal is the answer, so nothing more is waited for.
          if (ec) disarmAndClose();
        });
      });
    };
    resolver.async_resolve(host, std::to_string(port), resolved);
    runUntilStopped(io_);
    if (!connected)
      reportException(qf0::messages::ConnectionFailed(endpoint, failure ? failure.message() : "no answer"));
    io_.restart();
    handshakeDone_ = true;
    readNext();
    launch();
  }

  // Server side, on the listener's thread: takes the accepted socket, launches the I/O thread and
  // runs the opening handshake there. onHandshake runs on the I/O thread once it succeeded; on
  // failure the connection ends by itself.
  // A peer that asks for another target than `requiredTarget` (when not empty) is answered
  // "403 Forbidden" and dropped.
  void serve(tcp::socket socket, std::string requiredTarget, HandshakeDone onHandshake) {
    ws_.emplace(std::move(socket));
    beast::error_code ignored;
    beast::get_lowest_layer(*ws_).socket().set_option(tcp::no_delay(true), ignored);
    beast::get_lowest_layer(*ws_).expires_after(openTimeout);
    http::async_read(ws_->next_layer(), handshakeBuffer_, upgrade_,
                     [this, requiredTarget = std::move(requiredTarget), onHandshake = std::move(onHandshake)](
                         beast::error_code ec, std::size_t) mutable {
                       if (ec) {
                         finish("opening handshake failed: " + ec.message());
                         return;
                       }
                       if (!requiredTarget.empty() && !sameText(upgrade_.target(), requiredTarget)) {
                         refuse();
                         return;
                       }
                       // From here the WebSocket layer keeps the time; both must not be armed at once.
                       beast::get_lowest_layer(*ws_).expires_never();
                       configure();
                       ws_->async_accept(upgrade_,
                                         [this, onHandshake = std::move(onHandshake)](beast::error_code ec) {
                                           if (ec) {
                                             finish("opening handshake failed: " + ec.message());
                                             return;
                                           }
                                           if (finished_) return;
                                           handshakeDone_ = true;
                                           readNext();
                                           onHandshake(shared_from_this());
                                         });
                     });
    launch();
  }

  // Any thread.
  void start(SynchronizationChannel::MessageHandler onMessage,
             SynchronizationChannel::ClosedHandler onClosed) {
    bool ended = false;
    {
      // Ordered against the end of the I/O thread: exactly one of the two delivers what
      // was held back and onClosed when the thread has ended.
      std::lock_guard lock(endMutex_);
      state_.start(std::move(onMessage), std::move(onClosed));
      ended = ended_;
    }
    if (ended) {
      deliverHeld();
      state_.deliverClosed();
      return;
    }
    asio::post(io_, [this] { doStart(); });
  }

  // Any thread. What waits to be sent is bounded: a peer that leaves it unread is dropped
  // rather than let memory grow.
  void send(std::string message) {
    state_.checkCanSend(message.size());
    const std::size_t size = message.size();
    const std::size_t limit = WebSocketChannel::unsentLimit(state_.maxMessageSize());
    if (unsent_.fetch_add(size) + size > limit) {
      unsent_.fetch_sub(size);
      state_.markClosed(notReadingReason);
      asio::post(io_, [this] { drop(); });
      reportException(qf0::messages::ChannelClosed(notReadingReason));
    }
    asio::post(io_, [this, message = std::move(message)]() mutable { enqueue(std::move(message)); });
  }

  // Any thread: closes without waiting.
  void requestClose() {
    state_.markClosed("closed locally");
    asio::post(io_, [this] { doClose(); });
  }

  // Any thread: closes and, unless on the I/O thread, waits for it to end.
  void close() {
    requestClose();
    thread_.join();
  }

 private:
  // Compares in time that does not depend on where the texts differ: the target may hold a
  // shared secret.
  static bool sameText(beast::string_view given, const std::string& expected) {
    unsigned char difference = given.size() == expected.size() ? 0 : 1;
    for (std::size_t i = 0; i < expected.size(); ++i) {
      difference |= static_cast<unsigned char>(expected[i] ^ (i < given.size() ? given[i] : 0));
    }
    return difference == 0;
  }

  void refuse() {
    auto response =
        std::make_shared<http::response<http::string_body>>(http::status::forbidden, upgrade_.version());
    response->set(http::field::connection, "close");
    response->body() = "forbidden\n";
    response->prepare_payload();
    http::async_write(ws_->next_layer(), *response, [this, response](beast::error_code, std::size_t) {
      finish("opening handshake refused: the peer asked for another target");
    });
  }

  void configure() {
    // Packets are whole messages, mostly answered at once: waiting to coalesce them only adds
    // the peer's delayed-acknowledgement time to every exchange.
    beast::error_code ignored;
    beast::get_lowest_layer(*ws_).socket().set_option(tcp::no_delay(true), ignored);
    ws_->set_option(websocket::stream_base::timeout{openTimeout, idleTimeout, true});
    ws_->auto_fragment(false);  // one message, one frame
    ws_->read_message_max(state_.maxMessageSize());
  }

  void launch() {
    work_.emplace(io_.get_executor());
    thread_.launch([self = shared_from_this()] { self->run(); });
  }

  void run() {
    runUntilStopped(io_);
    bool started = false;
    {
      std::lock_guard lock(endMutex_);
      ended_ = true;
      started = state_.started();
    }
    if (started) {
      deliverHeld();
      state_.deliverClosed();
    }
  }

  void doStart() {
    deliverHeld();
    if (finished_) state_.deliverClosed();
  }

  // From start() on, messages go straight to the user; those that came earlier first.
  void deliverHeld() {
    if (delivering_) return;
    delivering_ = true;
    while (!held_.empty()) {
      std::string message = std::move(held_.front());
      held_.pop_front();
      state_.deliverMessage(std::move(message));
    }
  }

  void readNext() {
    readLimit_ = state_.maxMessageSize();
    ws_->read_message_max(readLimit_);
    ws_->async_read(readBuffer_, [this](beast::error_code ec, std::size_t) { onRead(ec); });
  }

  void onRead(beast::error_code ec) {
    if (ec) {
      finish(describe(ec));
      return;
    }
    // After a local close nothing more is delivered; the closing handshake reads the rest.
    if (finished_ || !state_.isOpen()) return;
    // The limit may have been lowered while this read was under way.
    if (const std::size_t limit = state_.maxMessageSize(); readBuffer_.size() > limit) {
      state_.markClosed(tooLargeReason(limit));
      closeCode_ = websocket::close_code::too_big;
      doClose();
      return;
    }
    std::string message = beast::buffers_to_string(readBuffer_.data());
    readBuffer_.clear();
    if (delivering_)
      state_.deliverMessage(std::move(message));
    else
      held_.push_back(std::move(message));
    if (!finished_ && state_.isOpen()) readNext();
  }

  void enqueue(std::string message) {
    if (finished_ || closeRequested_) {
      unsent_.fetch_sub(message.size());
      return;
    }
    outbox_.push_back(std::move(message));
    if (!writing_) writeNext();
  }

  void writeNext() {
    writing_ = true;
    ws_->text(true);
    ws_->async_write(asio::buffer(outbox_.front()), [this](beast::error_code ec, std::size_t) {
      unsent_.fetch_sub(outbox_.front().size());
      outbox_.pop_front();
      if (ec) {
        writing_ = false;
        finish(describe(ec));
        return;
      }
      if (!outbox_.empty() && !finished_) {
        writeNext();
        return;
      }
      writing_ = false;
      if (closeRequested_ && !closing_ && !finished_) startClosingHandshake();
    });
  }

  // Queued messages go first: the closing handshake starts once the outbox is empty.
  void doClose() {
    if (finished_ || closeRequested_) return;
    closeRequested_ = true;
    if (!handshakeDone_) {
      finish(state_.reason());
      return;
    }
    closeTimer_.expires_after(closeTimeout);
    closeTimer_.async_wait([this](beast::error_code ec) {
      if (ec) return;
      closing_ = false;  // give up on the peer
      finish(state_.reason());
      shutDown();
    });
    if (!writing_) startClosingHandshake();
  }

  // Ends the connection at once, without flushing what waits to be sent or a closing
  // handshake: for a peer that does not read, neither would ever finish.
  void drop() {
    if (finished_) return;
    closeRequested_ = true;
    closing_ = false;
    finish(state_.reason());
  }

  void startClosingHandshake() {
    closing_ = true;
    ws_->async_close(closeCode_, [this](beast::error_code) {
      closing_ = false;
      finish(state_.reason());
      shutDown();
    });
  }

  // The connection is over: record why (the first reason recorded wins), tell the user, and
  // stop the I/O unless the closing handshake is still under way.
  void finish(const std::string& reason) {
    if (finished_) return;
    finished_ = true;
    state_.markClosed(reason);
    shutDown();
    if (delivering_) state_.deliverClosed();
  }

  // Cancels everything still pending and lets the I/O thread run out of work.
  void shutDown() {
    if (!finished_ || closing_ || shutDown_) return;
    shutDown_ = true;
    closeTimer_.cancel();
    disarmAndClose();
    work_.reset();
  }

  // Turning both timeouts off cancels the WebSocket layer's own timer; closing the socket ends
  // whatever is still pending on it.
  void disarmAndClose() {
    const auto none = websocket::stream_base::none();
    ws_->set_option(websocket::stream_base::timeout{none, none, false});
    beast::get_lowest_layer(*ws_).close();
  }

  std::string describe(const beast::error_code& ec) const {
    // A peer's close frame says more than whatever error tearing the connection down gave.
    const auto& peer = ws_->reason();
    if (ec == websocket::error::closed || peer.code != websocket::close_code::none) {
      if (peer.code == websocket::close_code::too_big)
        return "closed by the peer: PacketTooLarge: a message exceeded the peer's limit";
      std::string text = "closed by the peer";
      if (peer.code != websocket::close_code::normal && peer.code != websocket::close_code::none) {
        text += " (code " + std::to_string(peer.code);
        if (!peer.reason.empty()) text += ": " + std::string(peer.reason.data(), peer.reason.size());
        text += ")";
      }
      return text;
    }
    if (ec == websocket::error::message_too_big) return tooLargeReason(readLimit_);
    if (ec == beast::error::timeout) return "connection lost: the peer stopped answering";
    return "connection lost: " + ec.message();
  }

  // Declared first so it is destroyed last, after everything that refers to it.
  asio::io_context io_;
  std::optional<asio::executor_work_guard<asio::io_context::executor_type>> work_;
  std::optional<websocket::stream<beast::tcp_stream>> ws_;
  asio::steady_timer closeTimer_{io_};
  beast::flat_buffer readBuffer_;
  beast::flat_buffer handshakeBuffer_;
  http::request<http::empty_body> upgrade_;  // the peer's opening request, server side
  std::size_t readLimit_ = 0;
  std::deque<std::string> outbox_;      // front() is being written while writing_
  std::atomic<std::size_t> unsent_{0};  // bytes sent by the user and not yet written
  std::deque<std::string> held_;        // received before start()
  websocket::close_code closeCode_ = websocket::close_code::normal;

  bool handshakeDone_ = false;
  bool delivering_ = false;  // start() has taken effect
  bool writing_ = false;
  bool closeRequested_ = false;
  bool closing_ = false;  // the closing handshake is under way
  bool finished_ = false;
  bool shutDown_ = false;

  std::mutex endMutex_;  // guards ended_
  bool ended_ = false;   // the I/O thread has run out of work
  ChannelState state_;
  OwnedThread thread_;
};

std::shared_ptr<SynchronizationChannel> WebSocketChannel::connect(const std::string& host, std::uint16_t port,
                                                                  const std::string& target) {
  auto connection = std::make_shared<WebSocketConnection>();
  connection->connect(host, port, target);
  return std::make_shared<WebSocketChannel>(std::move(connection));
}

WebSocketChannel::WebSocketChannel(std::shared_ptr<WebSocketConnection> connection)
    : connection_(std::move(connection)) {}

WebSocketChannel::~WebSocketChannel() { connection_->close(); }

void WebSocketChannel::start(MessageHandler onMessage, ClosedHandler onClosed) {
  connection_->start(std::move(onMessage), std::move(onClosed));
}

void WebSocketChannel::send(std::string message) { connection_->send(std::move(message)); }

void WebSocketChannel::close() { connection_->close(); }

bool WebSocketChannel::isOpen() const { return connection_->state().isOpen(); }

std::size_t WebSocketChannel::maxMessageSize() const { return connection_->state().maxMessageSize(); }

void WebSocketChannel::setMaxMessageSize(std::size_t bytes) { connection_->state().setMaxMessageSize(bytes); }

// The listening socket and its thread. Accepted sockets get a WebSocketConnection of their own
// right away, so a slow handshake never holds up the next peer.
class WebSocketListener::Acceptor : public std::enable_shared_from_this<Acceptor> {
 public:
  Acceptor(AcceptHandler onAccept, std::string requiredTarget)
      : onAccept_(std::move(onAccept)), requiredTarget_(std::move(requiredTarget)) {}

  std::uint16_t port() const noexcept { return port_; }

  // On the constructing thread, before launch(). Raises ListenFailed.
  void listen(const std::string& address, std::uint16_t port) {
    const std::string endpoint = address + ":" + std::to_string(port);
    beast::error_code ec;
    const auto fail = [&](const char* step) {
      reportException(qf0::messages::ListenFailed(endpoint, std::string(step) + ": " + ec.message()));
    };
    tcp::endpoint local;
    const auto ip = asio::ip::make_address(address, ec);
    if (!ec) {
      local = tcp::endpoint(ip, port);
    } else {
      ec.clear();
      tcp::resolver resolver(io_);
      const auto results = resolver.resolve(address, std::to_string(port), tcp::resolver::passive, ec);
      if (ec || results.empty()) fail("cannot resolve the address");
      local = results.begin()->endpoint();
    }
    acceptor_.open(local.protocol(), ec);
    if (ec) fail("cannot open a socket");
    acceptor_.set_option(asio::socket_base::reuse_address(true), ec);
    acceptor_.bind(local, ec);
    if (ec) fail("cannot bind");
    acceptor_.listen(asio::socket_base::max_listen_connections, ec);
    if (ec) fail("cannot listen");
    port_ = acceptor_.local_endpoint(ec).port();
    acceptNext();
  }

  void launch() {
    thread_.launch([self = shared_from_this()] { runUntilStopped(self->io_); });
  }

  // Any thread.
  void close() {
    std::vector<std::shared_ptr<WebSocketConnection>> unfinished;
    {
      std::lock_guard lock(mutex_);
      open_ = false;
      for (const auto& weak : handshaking_)
        if (auto connection = weak.lock()) unfinished.push_back(std::move(connection));
      handshaking_.clear();
    }
    asio::post(io_, [this] {
      beast::error_code ignored;
      retryTimer_.cancel();
      acceptor_.close(ignored);
    });
    thread_.join();
    for (const auto& connection : unfinished) connection->close();
  }

 private:
  // A socket accepted into the connection's own io_context.
  using AcceptedSocket = tcp::socket::rebind_executor<asio::io_context::executor_type>::other;

  void acceptNext() {
    auto next = std::make_shared<WebSocketConnection>();
    acceptor_.async_accept(next->context(), [this, next](beast::error_code ec, AcceptedSocket socket) {
      if (!acceptor_.is_open()) return;
      if (ec) {
        retryTimer_.expires_after(acceptRetryDelay);
        retryTimer_.async_wait([this](beast::error_code ec) {
          if (!ec && acceptor_.is_open()) acceptNext();
        });
        return;
      }
      {
        std::lock_guard lock(mutex_);
        std::erase_if(handshaking_, [](const auto& weak) { return weak.expired(); });
        // Each handshake under way holds a thread: past the limit a peer is turned away at
        // once, so that silent peers cannot pile threads up.
        if (handshaking_.size() >= WebSocketListener::maxPendingHandshakes) {
          beast::error_code ignored;
          socket.close(ignored);
          acceptNext();
          return;
        }
        handshaking_.push_back(next);
      }
      try {
        next->serve(tcp::socket(std::move(socket)), requiredTarget_,
                    [weak = weak_from_this()](const auto& connection) {
                      if (auto self = weak.lock())
                        self->handshakeDone(connection);
                      else
                        connection->requestClose();
                    });
      } catch (...) {
        // No thread for this peer (the system has none to give): it is dropped, and
        // accepting goes on.
      }
      acceptNext();
    });
  }

  // On the connection's thread.
  void handshakeDone(const std::shared_ptr<WebSocketConnection>& connection) {
    std::unique_lock lock(mutex_);
    std::erase_if(handshaking_,
                  [&](const auto& weak) { return weak.expired() || weak.lock() == connection; });
    if (!open_) {
      lock.unlock();
      connection->requestClose();
      return;
    }
    asio::post(io_, [this, channel = std::make_shared<WebSocketChannel>(connection)]() mutable {
      deliver(std::move(channel));
    });
  }

  void deliver(std::shared_ptr<SynchronizationChannel> channel) {
    {
      std::lock_guard lock(mutex_);
      if (!open_) return;
    }
    try {
      onAccept_(std::move(channel));
    } catch (...) {
      // Contract: dropped along with the channel.
    }
  }

  asio::io_context io_;
  tcp::acceptor acceptor_{io_};
  asio::steady_timer retryTimer_{io_};
  const AcceptHandler onAccept_;
  const std::string requiredTarget_;
  std::uint16_t port_ = 0;

  std::mutex mutex_;  // guards open_ and handshaking_
  bool open_ = true;
  std::vector<std::weak_ptr<WebSocketConnection>> handshaking_;

  OwnedThread thread_;
};

WebSocketListener::WebSocketListener(const std::string& address, std::uint16_t port, AcceptHandler onAccept,
                                     std::string requiredTarget)
    : acceptor_(std::make_shared<Acceptor>(std::move(onAccept), std::move(requiredTarget))) {
  acceptor_->listen(address, port);
  acceptor_->launch();
}

WebSocketListener::~WebSocketListener() { acceptor_->close(); }

std::uint16_t WebSocketListener::getPort() const noexcept { return acceptor_->port(); }

std::size_t WebSocketChannel::unsentLimit(std::size_t maxMessageSize) noexcept {
  constexpr std::size_t most = std::numeric_limits<std::size_t>::max();
  constexpr std::size_t burst = std::size_t{8} * 1024 * 1024;
  return maxMessageSize > most / 2 ? most : std::max(2 * maxMessageSize, burst);
}

void WebSocketListener::close() { acceptor_->close(); }

}  // namespace qf::zero::io
