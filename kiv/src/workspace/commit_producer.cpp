#include "kiv/workspace/commit_producer.h"

#include "kiv/history/element_reuse_model_builder.h"
#include "kiv/metamodel/branch_impl.h"
#include "kiv/metamodel/commit_impl.h"
#include "kiv/metamodel/delta_impl.h"
#include "kiv/metamodel/local_repository_impl.h"
#include "kiv/metamodel/workspace_impl.h"
#include "qf/zero/core/model_impl.h"
#include "qf/zero/core/transaction.h"
#include "qf/zero/io/json_change_report_synchronizer.h"

#include <boost/functional/hash.hpp>

#include <nlohmann/json.hpp>

#include <unordered_set>

namespace kiv {

// The saved value comes back on every exit: a rewrite that failed must not leave the
// producer deaf to the user's next transactions.
class CommitProducer::Pause {
 public:
  explicit Pause(bool& enabled) : enabled_(enabled), saved_(enabled) { enabled_ = false; }
  ~Pause() { enabled_ = saved_; }
  Pause(const Pause&) = delete;
  Pause& operator=(const Pause&) = delete;

 private:
  bool& enabled_;
  bool saved_;
};

CommitProducer::CommitProducer(Workspace workspace, qf::zero::Model model)
    : workspace_(std::move(workspace)), model_(std::move(model)) {}

CommitProducer::~CommitProducer() {
  detach();
  enabled_ = false;
}

void CommitProducer::attach() {
  if (model_ && !registered_) {
    model_->addShallowListener(this);
    registered_ = true;
  }
  enabled_ = true;
}

void CommitProducer::detach() noexcept {
  if (model_ && registered_) model_->removeListener(this);
  registered_ = false;
}

namespace {

bool isUserElement(const qf::zero::ModelElement& element) {
  return element.getMetaClass().conformsTo(qf::zero::ModelElement::metaClass());
}

}  // namespace

void CommitProducer::transactionCommitted(const std::shared_ptr<Report>& report) {
  if (!enabled_) return;
  const LocalRepository repository = workspace_->getRepository();
  const Branch head = repository->getHead();
  const qf::zero::Model repositoryModel = workspace_.getModel();
  Commit commit;
  {
    qf::zero::Transaction transaction = repositoryModel->beginTransaction(false);
    commit = Commit::create(repositoryModel);
    if (head && head->getTip()) commit->addParent(head->getTip());
    for (const qf::zero::ModelElement& element : report->getAdded()) {
      if (isUserElement(element)) commit->addCreated(element);
    }
    for (const qf::zero::ModelElement& element : report->getModified()) {
      if (isUserElement(element)) commit->addUpdated(element);
    }
    for (const qf::zero::ModelElement& element : report->getDestroyed()) {
      if (!isUserElement(element)) continue;
      Delta delta = commit->getDelta();
      if (!delta || !delta.isLive()) {
        delta = Delta::create(repositoryModel);
        commit->setDelta(delta);
      }
      delta->addDeleted(commit->find(element.getUuid()));
    }
    transaction.commit();
  }
  workspace_->commit(commit);
}

void CommitProducer::clearModel() {
  Pause pause(enabled_);
  qf::zero::Transaction transaction = model_->beginTransaction(false);
  for (qf::zero::ModelElement element : model_->getTopLevelElements()) element.destroy();
  transaction.commit();
}

void CommitProducer::update(const Delta& delta) {
  Pause pause(enabled_);
  qf::zero::io::JSONChangeReportSynchronizer::applyChangeReportVerbatim(
      delta->toChangeReport(), model_, std::make_unique<ElementReuseModelBuilder>());
}

void CommitProducer::replaceState(const Delta& state) {
  Pause pause(enabled_);
  std::unordered_set<qf::zero::Uuid, boost::hash<qf::zero::Uuid>> kept;
  for (const auto& [uuid, storage] : state->getCurrent().container()) kept.insert(uuid);
  qf::zero::Transaction transaction = model_->beginTransaction(false);
  for (qf::zero::ModelElement element : model_->getInstances(
           qf::zero::ModelElement::metaClass(), qf::zero::query::SearchClassMatchMode::IncludeSubclasses)) {
    if (element.isLive() && kept.count(element.getUuid()) == 0) element.destroy();
  }
  qf::zero::io::JSONChangeReportSynchronizer::applyChangeReportVerbatim(
      state->toChangeReport(), model_, std::make_unique<ElementReuseModelBuilder>());
  transaction.commit();
}

void CommitProducer::copyFrom(const CommitProducer& other) {
  if (&other == this) return;
  workspace_ = other.workspace_;
  if (model_ != other.model_) {
    detach();
    model_ = other.model_;
  }
  if (!other.enabled_) {
    enabled_ = false;
    return;
  }
  if (model_) attach();
}

}  // namespace kiv
