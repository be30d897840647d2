#include "history/history_support.h"
#include "kiv/merge/merge_strategy.h"
#include "kiv/messages/messages.h"
#include "kiv/metamodel/branch_impl.h"
#include "kiv/metamodel/commit_impl.h"
#include "kiv/metamodel/delta_impl.h"
#include "qf/zero/core/text.h"

namespace kiv {

namespace {

// The live tip, or null when the branch has none or it is gone.
Commit liveTip(const Branch::Impl& branch) {
  Commit tip = branch.getTip();
  return history::isLive(tip) ? tip : Commit();
}

Commit resolvedEntry(const Branch::Impl::RedoStackCollection& stack, std::size_t index) {
  return qf::zero::elementCast<Commit>(stack.resolveProxy(stack.basicAt(index)));
}

}  // namespace

bool Branch::Impl::isEmpty() const { return !liveTip(*this) && redoStack_.size() == 0; }

bool Branch::Impl::canUndo() const {
  const Commit tip = liveTip(*this);
  return tip && !tip->isEmpty();
}

bool Branch::Impl::canRedo() const { return redoStack_.size() != 0; }

// A branch moves forward by one commit whose first parent is its tip; a branch without a
// live tip takes any commit, even an initial one.
bool Branch::Impl::canCommit(const Commit& commit) const {
  if (!history::isLive(commit)) return false;
  const Commit tip = liveTip(*this);
  if (!tip) return true;
  return !commit->isInitial() && commit->getParent() == tip;
}

void Branch::Impl::commit(const Commit& commit) {
  if (!canCommit(commit)) qf::zero::reportException(messages::CannotCommit());
  qf::zero::Transaction transaction = history::beginTransactionOn(*this);
  setTip(commit);
  getRedoStackMutable().clear();
  transaction.commit();
}

// First parents only: undoing a merge returns to its first parent. The returned delta
// steps the user model back.
Delta Branch::Impl::undo() {
  if (!canUndo()) qf::zero::reportException(messages::CannotUndo());
  qf::zero::Transaction transaction = history::beginTransactionOn(*this);
  const Commit undone = liveTip(*this);
  RedoStackCollection& stack = getRedoStackMutable();
  stack.add(undone);
  setTip(undone->getParent());
  const Delta inverse = resolvedEntry(stack, stack.size() - 1)->getDelta()->invert();
  transaction.commit();
  return inverse;
}

// The redone commit's own delta, for the caller to apply as it is.
Delta Branch::Impl::redo() {
  if (!canRedo()) qf::zero::reportException(messages::CannotRedo());
  qf::zero::Transaction transaction = history::beginTransactionOn(*this);
  RedoStackCollection& stack = getRedoStackMutable();
  const Commit redone = resolvedEntry(stack, stack.size() - 1);
  setTip(redone);
  stack.removeAt(stack.size() - 1);
  transaction.commit();
  return redone ? redone->getDelta() : Delta();
}

// The commits must already be in this branch's model.
void Branch::Impl::update(const Branch& other) {
  history::requireLive(other, u"kiv.Branch.update");
  const Commit otherTip = other.getTip();
  qf::zero::Transaction transaction = history::beginTransactionOn(*this);
  setTip(otherTip ? findCommitByUUID(otherTip) : Commit());
  RedoStackCollection& stack = getRedoStackMutable();
  stack.clear();
  for (const qf::zero::ModelElement& entry : other->redoStack_.getAllValuesAndProxies()) {
    stack.add(findCommitByUUID(qf::zero::elementCast<Commit>(entry)));
  }
  transaction.commit();
}

Commit Branch::Impl::findCommitByUUID(const Commit& commit) const {
  if (!commit) qf::zero::reportException(qf0::messages::ElementRequired(u"kiv.Branch.findCommitByUUID"));
  const qf::zero::Uuid uuid = history::identityOf(commit);
  const Commit found = isLive() ? qf::zero::elementCast<Commit>(getModelImpl()->findElement(uuid)) : Commit();
  if (!found)
    qf::zero::reportException(messages::CannotFindElement(qf::zero::toUtf16(qf::zero::toText(uuid))));
  return found;
}

// Ours is the merge commit's first parent. A branch without a tip fast-forwards to
// theirs without asking the strategy.
void Branch::Impl::merge(const Branch& other, const IMergeStrategy& strategy) {
  history::requireLive(other, u"kiv.Branch.merge");
  const Commit theirs = liveTip(*other.getImpl());
  if (!theirs) return;
  qf::zero::Transaction transaction = history::beginTransactionOn(*this);
  if (const Commit ours = liveTip(*this)) {
    const Commit merged = strategy.run(ours, theirs);
    history::requireLive(merged, u"kiv.IMergeStrategy.run");
    merged->addParent(ours);
    merged->addParent(theirs);
    commit(merged);
  } else {
    commit(theirs);
  }
  transaction.commit();
}

// The new branch mirrors this one; its commits must already be in the target model. One
// transaction: a commit missing there leaves no half-made branch behind.
Branch Branch::Impl::clone(const qf::zero::Model& model) const {
  if (!model) qf::zero::reportException(qf0::messages::CannotCreateWithoutModel());
  qf::zero::Transaction transaction = model->beginTransaction();
  const Branch copy = Branch::create(model);
  copy->setName(name_);
  copy->update(Branch(const_cast<Impl*>(this)));
  transaction.commit();
  return copy;
}

bool Branch::Impl::isPredecessorOf(const Branch& other) const {
  const Commit mine = liveTip(*this);
  const Commit theirs = history::isLive(other) ? liveTip(*other.getImpl()) : Commit();
  return mine && theirs && mine->isPredecessorOf(theirs);
}

// The redo walk runs over this branch's stack only, without comparing lengths first:
// callers compare branches whose stacks were copied one from the other. A shorter other
// stack simply fails the comparison.
bool Branch::Impl::isEquivalent(const Branch& other, bool byValue) const {
  if (!history::isLive(other)) return false;
  const auto same = [&](const Commit& mine, const Commit& theirs) {
    if (!mine || !theirs) return !mine && !theirs;
    if (!byValue) return findCommitByUUID(theirs) == mine;
    return mine == theirs || mine->isEqual(theirs);
  };
  const Impl& that = *other.getImpl();
  if (!same(getTip(), that.getTip())) return false;
  for (std::size_t i = 0; i < redoStack_.size(); ++i) {
    if (i >= that.redoStack_.size() ||
        !same(resolvedEntry(redoStack_, i), resolvedEntry(that.redoStack_, i))) {
      return false;
    }
  }
  return name_ == that.name_;
}

bool Branch::Impl::areBranchMapsEquivalent(const std::map<std::u16string, Branch>& first,
                                           const std::map<std::u16string, Branch>& second) {
  if (first.size() != second.size()) return false;
  for (const auto& [name, branch] : first) {
    const auto counterpart = second.find(name);
    if (counterpart == second.end() || !history::isLive(branch) ||
        !branch->isEquivalent(counterpart->second, true)) {
      return false;
    }
  }
  return true;
}

}  // namespace kiv
