#include "foundation/core/except/exception.h"
#include "kiv/messages/messages.h"
#include "kiv/metamodel/branch_impl.h"
#include "kiv/metamodel/commit_impl.h"
#include "kiv/metamodel/local_repository_impl.h"
#include "kiv/metamodel/meta_package_kiv.h"
#include "kiv/metamodel/protocol/history.h"
#include "kiv/metamodel/repository_impl.h"
#include "kiv/repository/aggregate_model_traverser.h"
#include "kiv/repository/repository_listener.h"
#include "qf/zero/core/messages.h"
#include "qf/zero/core/meta/enum.h"
#include "qf/zero/core/model_impl.h"
#include "qf/zero/core/report_exception.h"
#include "qf/zero/core/text.h"
#include "qf/zero/core/transaction.h"
#include "qf/zero/io/json_serializer.h"
#include "qf/zero/io/packet_transport.h"
#include "qf/zero/io/serialization_output.h"
#include "repository/history_branches.h"
#include "repository/start_later_channel.h"

#include <nlohmann/json.hpp>

#include <exception>

namespace kiv {

namespace {

bool isPresent(const qf::zero::ModelElement& element) { return element && element.isLive(); }

qf::zero::Uuid identityOf(const qf::zero::ModelElement& element) {
  if (!element) return {};
  return element.isProxy() ? element->getProxyId().elementId : element.getUuid();
}

// One transaction of the repository's model (a savepoint of the caller's, when one is open).
qf::zero::Transaction beginOn(const Repository::Impl& repository) {
  if (repository.isProxy()) qf::zero::reportException(qf0::messages::CannotModifyProxy());
  if (!repository.isLive()) qf::zero::reportException(qf0::messages::CannotModifyDestroyedElement());
  return repository.getModelImpl()->beginTransaction();
}

// The live branch stored under `name`, or a null handle.
Branch branchNamed(const Repository::Impl& repository, const std::u16string& name) {
  const auto& branches = repository.getBranches().container();
  const auto found = branches.find(name);
  if (found == branches.end()) return {};
  const Branch branch =
      qf::zero::elementCast<Branch>(repository.getBranches().peekResolveProxy(found->second));
  return isPresent(branch) ? branch : Branch();
}

// The live branches of a repository in ascending name order, taken before a callback runs
// so that a callback that changes the map does not disturb the walk.
std::vector<Branch> liveBranches(const Repository::Impl& repository) {
  std::vector<Branch> result;
  for (const auto& [name, held] : repository.getBranches().container()) {
    if (const Branch branch = branchNamed(repository, name)) result.push_back(branch);
  }
  return result;
}

// Whether `mine` has the state `theirs` recorded: the same name, tip and redo stack by
// identity. Commits are compared by UUID, so a state recorded in another model counts.
bool hasState(const Branch& mine, const Branch& theirs) {
  if (!isPresent(mine) || !isPresent(theirs)) return false;
  if (mine->getName() != theirs->getName()) return false;
  if (identityOf(mine->getTip()) != identityOf(theirs->getTip())) return false;
  const auto ours = mine->getRedoStack().getAllValuesAndProxies();
  const auto other = theirs->getRedoStack().getAllValuesAndProxies();
  if (ours.size() != other.size()) return false;
  for (std::size_t i = 0; i < ours.size(); ++i) {
    if (identityOf(ours[i]) != identityOf(other[i])) return false;
  }
  return true;
}

// Erases the entry under `name`: a live branch by identity, a proxy by its proxy id. The
// branch itself is not destroyed: it leaves the repository.
void eraseEntry(Repository::Impl& repository, const std::u16string& name) {
  auto& branches = repository.getBranchesMutable();
  const auto found = branches.container().find(name);
  if (found == branches.container().end()) return;
  const Branch held = found->second;
  if (held.isProxy()) {
    branches.removeProxy(held->getProxyId());
  } else {
    branches.remove(held);
  }
}

}  // namespace

bool Repository::Impl::isEmpty() const { return branches_.size() == 0; }

bool Repository::Impl::canCheckout(const std::u16string& name) const {
  return static_cast<bool>(branchNamed(*this, name));
}

void Repository::Impl::add(const Branch& branch) {
  if (!isPresent(branch)) qf::zero::reportException(qf0::messages::ElementRequired(u"kiv.Repository.add"));
  if (canCheckout(branch->getName())) qf::zero::reportException(messages::BranchExists(branch->getName()));
  qf::zero::Transaction transaction = beginOn(*this);
  getBranchesMutable().add(branch);
  transaction.commit();
}

void Repository::Impl::remove(const std::u16string& name) {
  if (!canCheckout(name)) qf::zero::reportException(messages::CannotCheckout(name));
  qf::zero::Transaction transaction = beginOn(*this);
  eraseEntry(*this, name);
  transaction.commit();
}

bool Repository::Impl::isEquivalent(const Repository& other) const {
  if (!isPresent(other)) return false;
  const std::map<std::u16string, Branch> mine(branches_.container().begin(), branches_.container().end());
  const auto& theirsMap = other->getBranches().container();
  const std::map<std::u16string, Branch> theirs(theirsMap.begin(), theirsMap.end());
  // A branch compares its own redo stack only: asked from both sides, the answer does not
  // depend on which repository asks.
  if (!Branch::Impl::areBranchMapsEquivalent(mine, theirs)) return false;
  if (!Branch::Impl::areBranchMapsEquivalent(theirs, mine)) return false;
  const Branch myHead = getHead();
  const Branch theirHead = other->getHead();
  if (!myHead || !theirHead) return !myHead && !theirHead;
  if (!isPresent(theirHead) || !isPresent(myHead)) return false;
  return theirHead->isEquivalent(myHead, true) && myHead->isEquivalent(theirHead, true);
}

bool Repository::Impl::canPush(const protocol::History& history) const {
  if (!isPresent(history)) return false;
  const std::vector<Branch> previous = repository::branchesOf(history, true);
  if (branches_.size() != previous.size()) return false;
  for (const Branch& seen : previous) {
    if (!isPresent(seen) || !hasState(branchNamed(*this, seen->getName()), seen)) return false;
  }
  return true;
}

void Repository::Impl::syncCreated(const Repository& other,
                                   const std::function<void(const Branch&)>& created) {
  if (!isPresent(other))
    qf::zero::reportException(qf0::messages::ElementRequired(u"kiv.Repository.syncCreated"));
  for (const Branch& theirs : liveBranches(*other.getImpl())) {
    if (!canCheckout(theirs->getName())) created(theirs);
  }
}

void Repository::Impl::syncDeleted(const Repository& other,
                                   const std::function<void(const Branch&)>& deleted) {
  if (!isPresent(other))
    qf::zero::reportException(qf0::messages::ElementRequired(u"kiv.Repository.syncDeleted"));
  for (const Branch& mine : liveBranches(*this)) {
    if (!other->canCheckout(mine->getName())) deleted(mine);
  }
}

void Repository::Impl::syncUpdated(const Repository& other,
                                   const std::function<void(const Branch&, const Branch&)>& updated) {
  if (!isPresent(other))
    qf::zero::reportException(qf0::messages::ElementRequired(u"kiv.Repository.syncUpdated"));
  for (const Branch& mine : liveBranches(*this)) {
    if (const Branch theirs = branchNamed(*other.getImpl(), mine->getName())) updated(mine, theirs);
  }
}

void Repository::Impl::sync(const Repository& other,
                            const std::function<void(const Branch&, const Branch&)>& updated) {
  if (!isPresent(other)) qf::zero::reportException(qf0::messages::ElementRequired(u"kiv.Repository.sync"));
  const Branch head = getHead();
  if (isPresent(head) && !other->canCheckout(head->getName()))
    qf::zero::reportException(messages::HeadDelete());
  qf::zero::Transaction transaction = beginOn(*this);
  const qf::zero::Model model = getModel();
  syncCreated(other, [&](const Branch& theirs) { getBranchesMutable().add(theirs->clone(model)); });
  syncDeleted(other, [&](const Branch& mine) { eraseEntry(*this, mine->getName()); });
  syncUpdated(other, updated);
  transaction.commit();
}

void Repository::Impl::syncBranches(const Repository& other) {
  sync(other, [](const Branch& mine, const Branch& theirs) { mine->update(theirs); });
}

// The observer and its listener come in one transaction: a veto leaves neither.
void Repository::Impl::addRepositoryObserver(const RepositoryObserver& observer) {
  if (!isPresent(observer)) {
    qf::zero::reportException(qf0::messages::ElementRequired(u"kiv.Repository.addRepositoryObserver"));
  }
  qf::zero::Transaction transaction = beginOn(*this);
  if (!observers_.contains(observer)) getObserversMutable().add(observer);
  addRepositoryListener();
  transaction.commit();
}

// The listener is dropped after the observer's removal has committed, so that the
// transaction that removes the last observer is not seen by the listener it drops.
void Repository::Impl::removeRepositoryObserver(const RepositoryObserver& observer) {
  {
    qf::zero::Transaction transaction = beginOn(*this);
    if (observer && observer.isProxy()) {
      getObserversMutable().removeProxy(observer->getProxyId());
    } else if (isPresent(observer) && observers_.contains(observer)) {
      getObserversMutable().remove(observer);
    }
    transaction.commit();
  }
  removeRepositoryListener();
}

// Each call makes a new listener; the one it replaces stops listening once released.
void Repository::Impl::addRepositoryListener() {
  qf::zero::Transaction transaction = beginOn(*this);
  const protocol::History history = protocol::History::create(getModel());
  auto listener = std::make_shared<RepositoryListener>(Repository(this), history);
  listener->attach();
  if (const auto& previous = getRepositoryListener(); previous && isPresent(previous->getHistory())) {
    protocol::History(previous->getHistory()).destroy();
  }
  setRepositoryListener(listener);
  transaction.commit();
}

// The listener stays only while there are local observers and remote ones both.
void Repository::Impl::removeRepositoryListener() {
  if (observers_.size() != 0 && getNumRemoteObservers() > 0) return;
  const std::shared_ptr<RepositoryListener>& listener = getRepositoryListener();
  if (!listener) return;
  qf::zero::Transaction transaction = beginOn(*this);
  if (isPresent(listener->getHistory())) protocol::History(listener->getHistory()).destroy();
  setRepositoryListener(nullptr);
  transaction.commit();
}

// Every local observer is told, even when an earlier one fails; the first failure is
// raised afterwards.
void Repository::Impl::notifyObservers() {
  const Repository self(this);
  std::exception_ptr failure;
  for (const RepositoryObserver& observer : observers_.getTypedValues()) {
    if (!isPresent(observer)) continue;
    try {
      observer->repositoryModified(self);
    } catch (...) {
      if (!failure) failure = std::current_exception();
    }
  }
  if (getNumRemoteObservers() >= 1) {
    if (const auto& transport = getPacketTransport()) {
      try {
        transport->sendPacket(
            qf::zero::io::JSONPacket(toString(protocol::PacketType::RepositoryModified), nullptr));
      } catch (const foundation::core::except::ExceptionBase&) {
        // A peer that went away hears nothing more; the change it missed has been made.
      }
    }
  }
  if (failure) std::rethrow_exception(failure);
}

void Repository::Impl::setSynchronizationChannel(
    const std::shared_ptr<qf::zero::io::SynchronizationChannel>& channel) {
  // The channel starts once the handlers are in place: a peer's first request must find
  // its handler.
  std::shared_ptr<StartLaterChannel> held;
  {
    qf::zero::Transaction transaction = beginOn(*this);
    if (!channel) qf::zero::reportException(qf0::messages::CannotCreateTransportWithoutChannel());
    held = std::make_shared<StartLaterChannel>(channel);
    setPacketTransport(std::make_shared<qf::zero::io::PacketTransport>(held));
    transaction.commit();
  }
  try {
    setOnReceive();
  } catch (...) {
    held->open();
    throw;
  }
  held->open();
}

// The scratch repository and the history's branches live in a model of their own, which
// this repository keeps alive until the next call. The commits, deltas and storages its branches need
// land in this repository's model (what it holds already is kept as it is), in one
// transaction: a savepoint of the caller's when one is open, so that a caller that then
// refuses the history leaves nothing behind.
Repository Repository::Impl::unpackHistory(const qf::zero::JsonValue& historyJson) const {
  const qf::zero::Model scratchModel = qf::zero::Model::create();
  lastUnpackedModel_ = scratchModel;
  const protocol::History history = protocol::History::unpack(historyJson, scratchModel, getModel());
  LocalRepository scratch;
  {
    qf::zero::Transaction transaction = scratchModel->beginTransaction();
    scratch = LocalRepository::create(scratchModel);
    for (const Branch& branch : repository::branchesOf(history, false)) {
      if (isPresent(branch)) scratch->add(branch);
    }
    transaction.commit();
  }
  qf::zero::Transaction transaction = beginOn(*this);
  protocol::History carried = protocol::History::unpackNonBranches(historyJson, getModel());
  carried.destroy();
  transaction.commit();
  return scratch;
}

std::string Repository::Impl::toString(protocol::PacketType type) {
  const qf::zero::meta::EnumLiteral literal =
      MetaPackageKiv::getInstance().getPacketType()->findLiteral(static_cast<int>(type));
  if (!literal) qf::zero::reportException(qf0::messages::InvalidValue());
  return qf::zero::toUtf8(literal.getName());
}

std::string Repository::Impl::serializeAggregate(const qf::zero::ModelElement& element) {
  if (!element)
    qf::zero::reportException(qf0::messages::ElementRequired(u"kiv.Repository.serializeAggregate"));
  auto customizer = std::make_unique<qf::zero::io::ContainmentAggregateCustomizer>();
  customizer->setShouldSkipDefaultValues(false);
  qf::zero::io::JSONSerializer serializer(
      std::make_unique<AggregateModelTraverser>(element.getMetaClass().getQualifiedName()),
      std::move(customizer));
  qf::zero::JsonValue document;
  serializer.serialize(element, qf::zero::io::SerializationOutput::forIntermediateFormat(&document));
  return document.dump();
}

void Repository::Impl::invalidate() {
  lastUnpackedModel_ = qf::zero::Model();
  basicSetRepositoryListener(nullptr);
  basicSetPacketTransport(nullptr);
  RepositoryObserver::Impl::invalidate();
}

}  // namespace kiv
