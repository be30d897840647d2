#include "kiv/repository/repository_listener.h"

#include "kiv/metamodel/branch_impl.h"
#include "kiv/metamodel/commit_impl.h"
#include "kiv/metamodel/repository_impl.h"
#include "qf/zero/core/model_impl.h"

#include <algorithm>

namespace kiv {

namespace {

qf::zero::Uuid identityOf(const qf::zero::ModelElement& element) {
  if (!element) return {};
  return element.isProxy() ? element->getProxyId().elementId : element.getUuid();
}

// Clears the flag on every exit, so that a throwing observer does not silence the
// listener for good.
class BusyScope {
 public:
  explicit BusyScope(bool& busy) : busy_(busy) { busy_ = true; }
  ~BusyScope() { busy_ = false; }
  BusyScope(const BusyScope&) = delete;
  BusyScope& operator=(const BusyScope&) = delete;

 private:
  bool& busy_;
};

}  // namespace

RepositoryListener::RepositoryListener(Repository repository, protocol::History history)
    : repository_(std::move(repository)), history_(std::move(history)) {
  current_ = statesOf(repository_);
  previous_ = current_;
}

// The model is reached through the repository, never held: the model owns the
// repository, which owns this listener.
RepositoryListener::~RepositoryListener() {
  if (!registered_ || !repository_) return;
  if (qf::zero::ModelImpl* model = repository_->getModelImpl()) model->removeListener(this);
}

void RepositoryListener::attach() {
  if (registered_ || !repository_) return;
  qf::zero::ModelImpl* model = repository_->getModelImpl();
  if (model == nullptr) return;
  model->addDeepListener(this);
  registered_ = true;
}

RepositoryListener::BranchStates RepositoryListener::statesOf(const Repository& repository) {
  BranchStates states;
  if (!repository || !repository.isLive()) return states;
  for (const auto& [name, branch] : repository->getBranches().container()) {
    if (!branch || !branch.isLive()) continue;
    BranchState state{identityOf(branch->getTip()), {}};
    for (const qf::zero::ModelElement& entry : branch->getRedoStack().getAllValuesAndProxies()) {
      state.redoStack.push_back(identityOf(entry));
    }
    states.emplace(name, std::move(state));
  }
  return states;
}

bool RepositoryListener::touchesRepository(const Report& report) const {
  const auto isOurs = [this](const qf::zero::ModelElement& element) { return element == repository_; };
  const auto& containers = report.getAffectedContainers();
  if (std::any_of(containers.begin(), containers.end(), isOurs)) return true;
  const auto& entries = report.getEntries();
  return std::any_of(entries.begin(), entries.end(), [&](const qf::zero::ReportData::Entry& entry) {
    return isOurs(entry.element) || entry.element.getMetaClass().conformsTo(Branch::metaClass());
  });
}

void RepositoryListener::transactionCommitted(const std::shared_ptr<Report>& report) {
  if (busy_ || !touchesRepository(*report)) return;
  BusyScope scope(busy_);
  BranchStates now = statesOf(repository_);
  if (now == current_) return;
  previous_ = std::move(current_);
  current_ = std::move(now);
  modified_ = true;
  if (repository_.isLive()) repository_->notifyObservers();
}

}  // namespace kiv
