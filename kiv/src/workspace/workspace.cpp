#include "kiv/history/state_difference.h"
#include "kiv/merge/merge_strategy.h"
#include "kiv/messages/messages.h"
#include "kiv/metamodel/branch_impl.h"
#include "kiv/metamodel/commit_impl.h"
#include "kiv/metamodel/delta_impl.h"
#include "kiv/metamodel/local_repository_impl.h"
#include "kiv/metamodel/workspace_impl.h"
#include "kiv/workspace/commit_producer.h"
#include "qf/zero/core/messages.h"
#include "qf/zero/core/model_impl.h"
#include "qf/zero/core/report_exception.h"
#include "qf/zero/core/transaction.h"

#include <exception>
#include <functional>

namespace kiv {

namespace {

bool isPresent(const qf::zero::ModelElement& element) { return element && element.isLive(); }

// The live head branch of the workspace's repository; raises "CannotCommit" when the
// workspace belongs to no repository or the repository has no head.
Branch headOf(const Workspace::Impl& workspace) {
  const LocalRepository repository = workspace.getRepository();
  const Branch head = isPresent(repository) ? repository->getHead() : Branch();
  if (!isPresent(head)) qf::zero::reportException(messages::CannotCommit());
  return head;
}

Commit liveTipOf(const Branch& head) {
  const Commit tip = head->getTip();
  return isPresent(tip) ? tip : Commit();
}

// One transaction of the repository model: a savepoint of the caller's when one is open.
qf::zero::Transaction beginOn(const Workspace::Impl& workspace) {
  if (!workspace.isLive()) qf::zero::reportException(qf0::messages::CannotModifyDestroyedElement());
  return workspace.getModelImpl()->beginTransaction();
}

// The producer that `init` made; raises "ElementRequired" before `init` or after destruction.
CommitProducer& producerOf(const Workspace::Impl& workspace) {
  const std::shared_ptr<CommitProducer>& producer = workspace.getCommitProducer();
  if (!producer) qf::zero::reportException(qf0::messages::ElementRequired(u"kiv.Workspace.commitProducer"));
  return *producer;
}

// Commits the user model's rewrite and the repository transaction together: both are
// validated before either commits, so that a veto of either leaves both models as they
// were. A listener that fails once the user transaction has closed does not stop the
// repository's commit; its error is raised afterwards.
void commitTogether(qf::zero::Transaction& repository, CommitProducer::Rewrite& rewrite) {
  rewrite.transaction().prepare();
  repository.prepare();
  std::exception_ptr late;
  try {
    rewrite.transaction().commit();
  } catch (...) {
    late = std::current_exception();
  }
  repository.commit();
  if (late) std::rethrow_exception(late);
}

bool holdsWholeState(const Commit& commit) {
  const Delta delta = isPresent(commit) ? commit->getDelta() : Delta();
  return isPresent(delta) && delta->getIsSnapshot();
}

// Applies `delta` inside `rewrite` and destroys it: it is a temporary of the repository model.
void applyAndDrop(CommitProducer::Rewrite& rewrite, Delta delta) {
  rewrite.update(delta);
  delta.destroy();
}

// Rewrites the user model from the workspace's context to `target` inside `rewrite` and
// records `target` as the context. The caller's repository transaction is open.
// A whole state on the way (a snapshot, a merge's result) composes wrongly: inverted it
// deletes every element it holds, and a merge's state names no element of the merged-in
// line that it dropped. Such a way, and lines that went apart or never met, are crossed
// by comparing the two states.
void moveContext(Workspace::Impl& workspace, const Commit& target, CommitProducer::Rewrite& rewrite) {
  const Commit from = workspace.getCtx();
  workspace.setCtx(target);
  if (!isPresent(target)) {
    rewrite.clearModel();
  } else if (!isPresent(from)) {
    // The whole state of the new context: for an initial commit or a snapshot this is its
    // own delta, and for any other commit it is what the user model must become.
    applyAndDrop(rewrite, target->getSnapshot());
  } else if (const std::vector<Commit> ahead = target->findPath(from); !ahead.empty()) {
    applyAndDrop(rewrite, crossesWholeState(ahead) ? stateDifference(from, target) : target->diff(from));
  } else if (const std::vector<Commit> behind = from->findPath(target); !behind.empty()) {
    if (crossesWholeState(behind)) {
      applyAndDrop(rewrite, stateDifference(from, target));
    } else {
      Delta difference = from->diff(target);
      Delta backward = difference->invert();
      difference.destroy();
      applyAndDrop(rewrite, backward);
    }
  } else {
    applyAndDrop(rewrite, stateDifference(from, target));
  }
}

}  // namespace

bool Workspace::Impl::canRedo() const { return headOf(*this)->canRedo(); }

bool Workspace::Impl::canUndo() const { return headOf(*this)->canUndo(); }

bool Workspace::Impl::canCommit() const {
  const LocalRepository repository = getRepository();
  const Branch head = isPresent(repository) ? repository->getHead() : Branch();
  return isPresent(head) && head->getTip() == ctx_;
}

bool Workspace::Impl::canCheckout(const std::u16string& name) const {
  const LocalRepository repository = getRepository();
  return isPresent(repository) && repository->canCheckout(name);
}

void Workspace::Impl::updateContext() { setContext(liveTipOf(headOf(*this)), SetContextMode::ContextOnly); }

std::future<void> Workspace::Impl::push(PushMode mode) { return getRepository()->push(mode); }

// The user model is rewritten on the worker once the repository's pull has ended.
std::future<void> Workspace::Impl::pull() {
  const Workspace self(this);
  return std::async(std::launch::async, [self] {
    std::future<void> pulled = self->getRepository()->pull();
    pulled.get();
    self->updateContext();
  });
}

void Workspace::Impl::takeSnapshot() {
  const Branch head = headOf(*this);
  const qf::zero::Model& user = producerOf(*this).getModel();
  qf::zero::Transaction transaction = beginOn(*this);
  const Commit snapshot = Commit::create(getModel());
  if (const Commit tip = liveTipOf(head)) snapshot->addParent(tip);
  for (const qf::zero::ModelElement& element : user->getInstances(
           qf::zero::ModelElement::metaClass(), qf::zero::query::SearchClassMatchMode::IncludeSubclasses)) {
    snapshot->addCreated(element);
  }
  if (!snapshot->getDelta()) snapshot->setDelta(Delta::create(getModel()));
  snapshot->getDelta()->setIsSnapshot(true);
  setCtx(snapshot);
  head->commit(snapshot);
  transaction.commit();
}

// The user model is rewritten last, after every change of the repository model, so that a
// failure anywhere leaves both models as they were.
// Stepping back over a whole state (a snapshot, a merge's result) compares the two
// states: the inverse of a whole state would delete every element it holds.
void Workspace::Impl::undo() {
  const Branch head = headOf(*this);
  qf::zero::Transaction transaction = beginOn(*this);
  const Commit undone = liveTipOf(head);
  Delta back = head->undo();
  const Commit tip = liveTipOf(head);
  setCtx(tip);
  if (holdsWholeState(undone)) {
    back.destroy();
    back = stateDifference(undone, tip);
  }
  CommitProducer::Rewrite rewrite(producerOf(*this));
  applyAndDrop(rewrite, back);
  commitTogether(transaction, rewrite);
}

// The redone commit's delta belongs to its commit: it is applied, never destroyed. A
// whole state is reached, as undo leaves it, by comparing the two states.
void Workspace::Impl::redo() {
  const Branch head = headOf(*this);
  qf::zero::Transaction transaction = beginOn(*this);
  const Commit before = liveTipOf(head);
  const Delta forward = head->redo();
  const Commit tip = liveTipOf(head);
  setCtx(tip);
  CommitProducer::Rewrite rewrite(producerOf(*this));
  if (holdsWholeState(tip)) {
    applyAndDrop(rewrite, stateDifference(before, tip));
  } else if (isPresent(forward)) {
    rewrite.update(forward);
  }
  commitTogether(transaction, rewrite);
}

void Workspace::Impl::setContext(const Commit& commit, SetContextMode mode) {
  if (commit == ctx_) return;
  CommitProducer& producer = producerOf(*this);
  qf::zero::Transaction transaction = beginOn(*this);
  if (mode == SetContextMode::BranchUpdate) {
    const Branch head = headOf(*this);
    head->setTip(commit);
    head->getRedoStackMutable().clear();
  }
  CommitProducer::Rewrite rewrite(producer);
  moveContext(*this, commit, rewrite);
  commitTogether(transaction, rewrite);
}

void Workspace::Impl::branch(const std::u16string& name) {
  const LocalRepository repository = getRepository();
  if (!isPresent(repository))
    qf::zero::reportException(qf0::messages::ElementRequired(u"kiv.Workspace.repository"));
  if (repository->canCheckout(name)) qf::zero::reportException(messages::BranchExists(name));
  qf::zero::Transaction transaction = beginOn(*this);
  const Branch created = Branch::create(getModel());
  created->setName(name);
  if (isPresent(ctx_)) created->commit(ctx_);
  repository->add(created);
  repository->checkout(name);
  transaction.commit();
}

void Workspace::Impl::checkout(const std::u16string& name) {
  const LocalRepository repository = getRepository();
  if (!isPresent(repository) || !repository->canCheckout(name)) {
    qf::zero::reportException(messages::CannotCheckout(name));
  }
  CommitProducer& producer = producerOf(*this);
  qf::zero::Transaction transaction = beginOn(*this);
  repository->checkout(name);
  CommitProducer::Rewrite rewrite(producer);
  const Commit target = liveTipOf(repository->getHead());
  if (target != ctx_) moveContext(*this, target, rewrite);
  commitTogether(transaction, rewrite);
}

void Workspace::Impl::merge(const std::u16string& name) {
  const LocalRepository repository = getRepository();
  if (!isPresent(repository) || !repository->canCheckout(name)) {
    qf::zero::reportException(messages::CannotCheckout(name));
  }
  const std::shared_ptr<IMergeStrategy>& strategy = repository->getIMergeStrategy();
  if (!strategy)
    qf::zero::reportException(qf0::messages::ElementRequired(u"kiv.LocalRepository.IMergeStrategy"));
  const Branch head = headOf(*this);
  CommitProducer& producer = producerOf(*this);
  const auto& branches = repository->getBranches().container();
  const auto other = branches.find(name);
  qf::zero::Transaction transaction = beginOn(*this);
  head->merge(other == branches.end() ? Branch() : other->second, *strategy);
  CommitProducer::Rewrite rewrite(producer);
  const Commit target = liveTipOf(head);
  if (target != ctx_) moveContext(*this, target, rewrite);
  commitTogether(transaction, rewrite);
}

// A commit that records nothing (a transaction that changed nothing) is not taken: it
// would sit at the tip as a step that cannot be undone. It is destroyed instead.
void Workspace::Impl::commit(const Commit& commit) {
  if (!canCommit()) qf::zero::reportException(messages::CannotCommit());
  const Branch head = headOf(*this);
  qf::zero::Transaction transaction = beginOn(*this);
  if (isPresent(commit) && commit->isEmpty() && commit->getParent() == ctx_ && ctx_) {
    Commit(commit).destroy();
    transaction.commit();
    return;
  }
  head->commit(commit);
  setCtx(commit);
  transaction.commit();
}

Commit Workspace::Impl::getContext() const { return ctx_; }

void Workspace::Impl::init(const qf::zero::Model& userModel) {
  if (!userModel) qf::zero::reportException(qf0::messages::ElementRequired(u"kiv.Workspace.init"));
  qf::zero::Transaction transaction = beginOn(*this);
  if (!commitProducer_) {
    auto created = std::make_shared<CommitProducer>(Workspace(this), userModel);
    created->attach();
    setCommitProducer(created);
  }
  const LocalRepository repository = getRepository();
  const Branch head = isPresent(repository) ? repository->getHead() : Branch();
  setCtx(isPresent(head) ? liveTipOf(head) : Commit());
  transaction.commit();
}

void Workspace::Impl::update(const Delta& delta) {
  if (!isPresent(delta)) qf::zero::reportException(qf0::messages::ElementRequired(u"kiv.Workspace.update"));
  producerOf(*this).update(delta);
}

void Workspace::Impl::commitTransaction(const std::function<void()>& edit) {
  qf::zero::Transaction transaction = producerOf(*this).getModel()->beginTransaction(false);
  edit();
  transaction.commit();
}

// The host callback runs on a copy that dies before the commit, whatever the callback does
// with the original meanwhile.
void Workspace::Impl::commitTransaction(const qf::zero::HxArray& callback) {
  qf::zero::Transaction transaction = producerOf(*this).getModel()->beginTransaction(false);
  {
    const qf::zero::HxArray copy = callback;
    copy({});
  }
  transaction.commit();
}

void Workspace::Impl::synchronousPush(PushMode mode) {
  std::future<void> pending = push(mode);
  pending.wait();
}

void Workspace::Impl::synchronousPull() {
  std::future<void> pending = pull();
  pending.wait();
}

void Workspace::Impl::aboutToDestroy() { setCommitProducer(nullptr); }

void Workspace::Impl::invalidate() {
  basicSetCommitProducer(nullptr);
  qf::zero::ModelElement::Impl::invalidate();
}

}  // namespace kiv
