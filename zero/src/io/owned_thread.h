#pragma once

#include <atomic>
#include <condition_variable>
#include <functional>
#include <mutex>
#include <thread>

namespace qf::zero::io {

// One background thread that its owner may be asked to end from any thread, including from the
// thread itself (a callback that closes or destroys what runs it). join() from another thread
// waits until the body has returned; join() from the thread itself detaches it instead, so the
// body must keep alive whatever it uses, typically by capturing a shared_ptr to its owner.
// All members are thread-safe.
class OwnedThread {
 public:
  OwnedThread() = default;
  OwnedThread(const OwnedThread&) = delete;
  OwnedThread& operator=(const OwnedThread&) = delete;
  ~OwnedThread() { join(); }

  // Runs body on a new thread. REQUIRES: not launched before.
  void launch(std::function<void()> body);

  // True when called from the thread itself.
  bool isCurrent() const noexcept { return id_.load() == std::this_thread::get_id(); }

  // Returns once the body has returned (at once if never launched); from the thread itself,
  // detaches instead.
  void join();

 private:
  std::mutex mutex_;
  std::condition_variable ended_;
  std::thread thread_;
  std::atomic<std::thread::id> id_{};
  bool launched_ = false;
  bool claimed_ = false;  // someone joins or has detached thread_
  bool bodyReturned_ = false;
};

}  // namespace qf::zero::io
