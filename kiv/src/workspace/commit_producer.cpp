#include "kiv/workspace/commit_producer.h"

#include "kiv/history/element_reuse_model_builder.h"
#include "kiv/messages/messages.h"
#include "kiv/metamodel/branch_impl.h"
#include "kiv/metamodel/commit_impl.h"
#include "kiv/metamodel/delta_impl.h"
#include "kiv/metamodel/local_repository_impl.h"
#include "kiv/metamodel/workspace_impl.h"
#include "qf/zero/core/internal/flat_table.h"
#include "qf/zero/core/model_impl.h"
#include "qf/zero/core/transaction.h"
#include "qf/zero/io/json_change_report_synchronizer.h"

#include <nlohmann/json.hpp>

#include <unordered_set>

namespace kiv {

// The saved state comes back on every exit: a rewrite that failed must not leave the
// producer deaf to the user's next transactions.
CommitProducer::Rewrite::Rewrite(CommitProducer& producer)
    : producer_(producer), saved_(producer.enabled_), transaction_(producer.model_->beginTransaction(false)) {
  producer_.enabled_ = false;
}

CommitProducer::Rewrite::~Rewrite() {
  transaction_.cancel();
  producer_.enabled_ = saved_;
}

void CommitProducer::Rewrite::update(const Delta& delta) {
  qf::zero::io::JSONChangeReportSynchronizer::applyChangeReportVerbatim(
      delta->toChangeReport(), producer_.model_, std::make_unique<ElementReuseModelBuilder>());
}

void CommitProducer::Rewrite::clearModel() {
  for (qf::zero::ModelElement element : producer_.model_->getTopLevelElements()) element.destroy();
}

void CommitProducer::Rewrite::replaceState(const Delta& state) {
  std::unordered_set<qf::zero::Uuid, qf::zero::internal::KeyedUuidHash> kept;
  for (const auto& [uuid, storage] : state->getCurrent().container()) kept.insert(uuid);
  for (qf::zero::ModelElement element : producer_.model_->getInstances(
           qf::zero::ModelElement::metaClass(), qf::zero::query::SearchClassMatchMode::IncludeSubclasses)) {
    if (element.isLive() && kept.count(element.getUuid()) == 0) element.destroy();
  }
  update(state);
}

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

Commit CommitProducer::record(const Report& report) const {
  const LocalRepository repository = workspace_->getRepository();
  const Branch head = repository ? repository->getHead() : Branch();
  const qf::zero::Model repositoryModel = workspace_.getModel();
  const Commit commit = Commit::create(repositoryModel);
  if (head && head.isLive() && head->getTip()) commit->addParent(head->getTip());
  for (const qf::zero::ModelElement& element : report.getAdded()) {
    if (isUserElement(element)) commit->addCreated(element);
  }
  for (const qf::zero::ModelElement& element : report.getModified()) {
    if (isUserElement(element)) commit->addUpdated(element);
  }
  for (const qf::zero::ModelElement& element : report.getDestroyed()) {
    if (!isUserElement(element)) continue;
    Delta delta = commit->getDelta();
    if (!delta || !delta.isLive()) {
      delta = Delta::create(repositoryModel);
      commit->setDelta(delta);
    }
    delta->addDeleted(commit->find(element.getUuid()));
  }
  return commit;
}

void CommitProducer::validateOnCommit(const std::shared_ptr<Report>& report) {
  pending_.reset();
  if (!enabled_) return;
  Pending pending{workspace_.getModel()->beginTransaction(false), Commit(), false, report};
  pending.commit = record(*report);
  pending.attached = workspace_->canCommit();
  if (pending.attached) workspace_->commit(pending.commit);
  pending.transaction.prepare();
  pending_ = std::move(pending);
}

void CommitProducer::transactionCommitted(const std::shared_ptr<Report>& report) {
  std::optional<Pending> pending = std::move(pending_);
  pending_.reset();
  if (!enabled_) return;
  if (pending && pending->report == report) {
    pending->transaction.commit();
    if (!pending->attached) qf::zero::reportException(messages::CannotCommit());
    return;
  }
  // Another listener changed the user transaction after it was validated: the commit is
  // made again from the final report.
  if (pending) pending->transaction.cancel();
  Commit commit;
  {
    qf::zero::Transaction transaction = workspace_.getModel()->beginTransaction(false);
    commit = record(*report);
    transaction.commit();
  }
  workspace_->commit(commit);
}

void CommitProducer::transactionCanceled(bool /*vetoed*/, const std::shared_ptr<Report>& /*report*/) {
  pending_.reset();
}

void CommitProducer::clearModel() {
  Rewrite rewrite(*this);
  rewrite.clearModel();
  rewrite.transaction().commit();
}

void CommitProducer::update(const Delta& delta) {
  Rewrite rewrite(*this);
  rewrite.update(delta);
  rewrite.transaction().commit();
}

void CommitProducer::replaceState(const Delta& state) {
  Rewrite rewrite(*this);
  rewrite.replaceState(state);
  rewrite.transaction().commit();
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
