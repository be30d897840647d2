#include "kiv/merge/default_merge_strategy.h"
#include "kiv/merge/merge_strategy.h"
#include "kiv/messages/messages.h"
#include "kiv/metamodel/branch_impl.h"
#include "kiv/metamodel/commit_impl.h"
#include "kiv/metamodel/local_repository_impl.h"
#include "kiv/metamodel/meta_package_kiv.h"
#include "kiv/metamodel/workspace_impl.h"
#include "kiv/repository/notice_executor.h"
#include "kiv/workspace/commit_producer.h"
#include "qf/zero/core/messages.h"
#include "qf/zero/core/model_impl.h"
#include "qf/zero/core/report_exception.h"
#include "qf/zero/core/transaction.h"
#include "qf/zero/io/packet_transport.h"

#include <nlohmann/json.hpp>

namespace kiv {

namespace {

bool isPresent(const qf::zero::ModelElement& element) { return element && element.isLive(); }

qf::zero::Transaction beginOn(const LocalRepository::Impl& repository) {
  if (repository.isProxy()) qf::zero::reportException(qf0::messages::CannotModifyProxy());
  if (!repository.isLive()) qf::zero::reportException(qf0::messages::CannotModifyDestroyedElement());
  return repository.getModelImpl()->beginTransaction();
}

bool isKivElement(const qf::zero::ModelElement& element) {
  return element.getMetaClass().getQualifiedName().starts_with(u"kiv.");
}

// A swapped call can be told only when a model already holds something: repository
// elements in the user model, or user elements in the repository model.
void requireModelsInOrder(const qf::zero::Model& userModel, const qf::zero::Model& repositoryModel) {
  if (!userModel || !repositoryModel) {
    qf::zero::reportException(qf0::messages::ElementRequired(u"kiv.LocalRepository.create"));
  }
  if (userModel == repositoryModel) qf::zero::reportException(messages::ModelsIdentical());
  const auto repositories = userModel->getInstances(RepositoryObserver::metaClass(),
                                                    qf::zero::query::SearchClassMatchMode::IncludeSubclasses);
  if (!repositories.empty()) qf::zero::reportException(messages::ModelsSwapped());
  for (const qf::zero::ModelElement& element : repositoryModel->getTopLevelElements()) {
    if (!isKivElement(element)) qf::zero::reportException(messages::ModelsSwapped());
  }
}

}  // namespace

LocalRepository LocalRepository::Impl::create(const qf::zero::Model& repositoryModel,
                                              const qf::zero::Model& userModel) {
  requireModelsInOrder(userModel, repositoryModel);
  qf::zero::Transaction transaction = repositoryModel->beginTransaction();
  const LocalRepository repository = LocalRepository::create(repositoryModel);
  repository->getWorkspace(userModel);
  transaction.commit();
  return repository;
}

void LocalRepository::Impl::init(RepoType type) {
  qf::zero::Transaction transaction = beginOn(*this);
  const Branch master = Branch::create(getModel());
  master->setName(u"master");
  add(master);
  setHead(master);
  setIsBare(type == RepoType::Bare);
  setDefaultMergeStrategy();
  transaction.commit();
}

LocalRepository LocalRepository::Impl::clone(const Repository& origin, RepoType type) {
  if (!isPresent(origin)) qf::zero::reportException(messages::NoOrigin());
  const qf::zero::Model model = origin.getModel();
  qf::zero::Transaction transaction = model->beginTransaction();
  const LocalRepository copy = LocalRepository::create(model);
  copy->setOrigin(origin);
  copy->setIsBare(type == RepoType::Bare);
  copy->setDefaultMergeStrategy();
  for (const auto& [name, held] : origin->getBranches().container()) {
    const Branch branch = qf::zero::elementCast<Branch>(origin->getBranches().peekResolveProxy(held));
    if (isPresent(branch)) copy->add(branch->clone(model));
  }
  if (const Branch head = origin->getHead(); isPresent(head)) copy->checkout(head->getName());
  transaction.commit();
  return copy;
}

LocalRepository LocalRepository::Impl::clone(RepoType type) const {
  return clone(Repository(const_cast<Impl*>(this)), type);
}

Workspace LocalRepository::Impl::getWorkspace(const qf::zero::Model& userModel) {
  if (!userModel)
    qf::zero::reportException(qf0::messages::ElementRequired(u"kiv.LocalRepository.getWorkspace"));
  if (Workspace existing = getWs(); isPresent(existing)) {
    const std::shared_ptr<CommitProducer>& producer = existing->getCommitProducer();
    if (producer && producer->getModel() == userModel) return existing;
    qf::zero::Transaction transaction = beginOn(*this);
    existing->setCommitProducer(nullptr);
    existing->init(userModel);
    transaction.commit();
    return existing;
  }
  qf::zero::Transaction transaction = beginOn(*this);
  const Workspace workspace = Workspace::create(getModel());
  setWs(workspace);
  workspace->init(userModel);
  transaction.commit();
  return workspace;
}

void LocalRepository::Impl::checkout(const std::u16string& name) {
  if (!canCheckout(name)) qf::zero::reportException(messages::CannotCheckout(name));
  qf::zero::Transaction transaction = beginOn(*this);
  setHead(qf::zero::elementCast<Branch>(getBranches().peekResolveProxy(getBranches().container().at(name))));
  transaction.commit();
}

void LocalRepository::Impl::setDefaultMergeStrategy() {
  qf::zero::Transaction transaction = beginOn(*this);
  setIMergeStrategy(makeDefaultMergeStrategy());
  transaction.commit();
}

void LocalRepository::Impl::synchronousPush(PushMode mode) {
  std::future<void> pending = push(mode);
  pending.wait();
}

void LocalRepository::Impl::synchronousPull() {
  std::future<void> pending = pull();
  pending.wait();
}

void LocalRepository::Impl::startObservingOrigin() {
  const Repository origin = getOrigin();
  if (!isPresent(origin)) qf::zero::reportException(messages::NoOrigin());
  origin->addRepositoryObserver(LocalRepository(this));
}

void LocalRepository::Impl::stopObservingOrigin() {
  const Repository origin = getOrigin();
  if (!isPresent(origin)) qf::zero::reportException(messages::NoOrigin());
  origin->removeRepositoryObserver(LocalRepository(this));
}

void LocalRepository::Impl::repositoryModified(const Repository& source) {
  const Repository origin = getOrigin();
  if (!source || source != origin) qf::zero::reportException(messages::CannotPull());
  const LocalRepository self(this);
  if (const std::shared_ptr<NoticeExecutor> executor = getNoticeExecutor(self)) {
    executor->post([self] { self->pull().wait(); });
    return;
  }
  pull().wait();
}

void LocalRepository::Impl::collectGarbage() {}

void LocalRepository::Impl::tailChop(const Dependency& /*tail*/) {}

void LocalRepository::Impl::load(const Dependency& /*history*/) {}

void LocalRepository::Impl::requestPull(const Dependency& /*source*/) {}

}  // namespace kiv
