#include "io/owned_thread.h"

#include <utility>

namespace qf::zero::io {

void OwnedThread::launch(std::function<void()> body) {
  std::lock_guard lock(mutex_);
  launched_ = true;
  thread_ = std::thread([this, body = std::move(body)] {
    id_ = std::this_thread::get_id();
    body();
    // Notified under the lock: a waiter may destroy this object as soon as it can see the flag.
    std::lock_guard ended(mutex_);
    bodyReturned_ = true;
    ended_.notify_all();
  });
  id_ = thread_.get_id();
}

void OwnedThread::join() {
  std::unique_lock lock(mutex_);
  if (!launched_) return;
  if (isCurrent()) {
    if (!claimed_) {
      claimed_ = true;
      thread_.detach();
    }
    return;
  }
  if (!claimed_) {
    claimed_ = true;
    std::thread thread = std::move(thread_);
    lock.unlock();
    thread.join();
    return;
  }
  ended_.wait(lock, [this] { return bodyReturned_; });
}

}  // namespace qf::zero::io
