// NoticeExecutor: where a local repository runs the pull that a change notice of its
// origin asks for.
//
// By default a notice pulls on the notifier's thread (the thread that pushed into the
// origin, or a transport's thread) and waits for the pull, while the observing
// application may be editing the same repository: the rules of the library forbid that
// overlap, and only the application can avoid it. An application that installs an
// executor decides instead when and on which thread the pull runs:
//
//   auto notices = std::make_shared<kiv::QueuedNoticeExecutor>();
//   kiv::setNoticeExecutor(clone, notices);      // before clone->startObservingOrigin()
//   ...
//   notices->runPending();   // on the application's own thread, between its edits
//
// The check of the notice ("CannotPull" from a repository that is not the origin) is
// still made on the notifier's thread; only the pull is handed over.
#pragma once

#include "kiv/metamodel/local_repository.h"

#include <chrono>
#include <condition_variable>
#include <cstddef>
#include <deque>
#include <functional>
#include <memory>
#include <mutex>

namespace kiv {

// Decides when and on which thread the pull of a change notice runs. post() is called on the
// notifier's thread and must return promptly.
class NoticeExecutor {
 public:
  virtual ~NoticeExecutor() = default;
  // Called on the notifier's thread; must not block for long. `work` pulls and waits
  // for the pull; it raises nothing (a failed pull is dropped as by synchronousPull).
  virtual void post(std::function<void()> work) = 0;
};

// Keeps posted work until the application runs it. Every member may be called from any
// thread.
class QueuedNoticeExecutor : public NoticeExecutor {
 public:
  void post(std::function<void()> work) override;

  // Runs, on the calling thread, the work posted before the call, in posting order;
  // returns how many items ran.
  std::size_t runPending();
  // Waits until some work is pending or `timeout` has passed; true when work is pending.
  bool waitForWork(std::chrono::milliseconds timeout);
  std::size_t pendingCount() const;

 private:
  mutable std::mutex mutex_;
  std::condition_variable arrived_;
  std::deque<std::function<void()>> pending_;
};

// Installs `executor` for the change notices that `repository` receives; null returns
// to pulling on the notifier's thread. The executor is not part of the repository's state:
// no transaction records it and it is never written. Call it while no notice can arrive
// (before observing the origin, for instance). REQUIRES: `repository` is live.
void setNoticeExecutor(const LocalRepository& repository, std::shared_ptr<NoticeExecutor> executor);
// The executor installed for `repository`, or null.
std::shared_ptr<NoticeExecutor> getNoticeExecutor(const LocalRepository& repository);

}  // namespace kiv
