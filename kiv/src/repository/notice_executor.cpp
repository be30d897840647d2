#include "kiv/repository/notice_executor.h"

#include "kiv/metamodel/local_repository_impl.h"
#include "qf/zero/core/messages.h"
#include "qf/zero/core/model_impl.h"
#include "qf/zero/core/report_exception.h"

#include <unordered_map>
#include <utility>

namespace kiv {

void QueuedNoticeExecutor::post(std::function<void()> work) {
  {
    const std::lock_guard<std::mutex> lock(mutex_);
    pending_.push_back(std::move(work));
  }
  arrived_.notify_all();
}

std::size_t QueuedNoticeExecutor::runPending() {
  std::deque<std::function<void()>> batch;
  {
    const std::lock_guard<std::mutex> lock(mutex_);
    batch.swap(pending_);
  }
  for (auto& work : batch) work();
  return batch.size();
}

bool QueuedNoticeExecutor::waitForWork(std::chrono::milliseconds timeout) {
  std::unique_lock<std::mutex> lock(mutex_);
  return arrived_.wait_for(lock, timeout, [this] { return !pending_.empty(); });
}

std::size_t QueuedNoticeExecutor::pendingCount() const {
  const std::lock_guard<std::mutex> lock(mutex_);
  return pending_.size();
}

namespace {

// The executors of the repositories of one model, kept beside the model.
struct NoticeExecutors {
  std::mutex mutex;
  std::unordered_map<const void*, std::shared_ptr<NoticeExecutor>> byRepository;
};

const char attachmentKey = 0;

}  // namespace

void setNoticeExecutor(const LocalRepository& repository, std::shared_ptr<NoticeExecutor> executor) {
  if (!repository || !repository.isLive() || repository->getModelImpl() == nullptr) {
    qf::zero::reportException(qf0::messages::ElementRequired(u"kiv.setNoticeExecutor"));
  }
  std::shared_ptr<void>& slot = repository->getModelImpl()->attachment(&attachmentKey);
  if (!slot) slot = std::make_shared<NoticeExecutors>();
  auto& executors = *std::static_pointer_cast<NoticeExecutors>(slot);
  const std::lock_guard<std::mutex> lock(executors.mutex);
  if (executor) {
    executors.byRepository[repository.getImpl()] = std::move(executor);
  } else {
    executors.byRepository.erase(repository.getImpl());
  }
}

std::shared_ptr<NoticeExecutor> getNoticeExecutor(const LocalRepository& repository) {
  if (!repository || repository->getModelImpl() == nullptr) return nullptr;
  const auto slot =
      std::static_pointer_cast<NoticeExecutors>(repository->getModelImpl()->findAttachment(&attachmentKey));
  if (!slot) return nullptr;
  const std::lock_guard<std::mutex> lock(slot->mutex);
  const auto found = slot->byRepository.find(repository.getImpl());
  return found == slot->byRepository.end() ? nullptr : found->second;
}

}  // namespace kiv
