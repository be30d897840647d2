#include "history/first_parent_states.h"

#include "history/history_support.h"
#include "kiv/metamodel/commit_impl.h"
#include "kiv/metamodel/delta_impl.h"

#include <memory>

namespace kiv::history {

namespace {

// The address names the index among the model's attachments.
const int kAttachmentKey = 0;

// The first parent as held: a proxy stays a proxy, nothing is loaded.
qf::zero::ModelElement heldFirstParent(const Commit& commit) {
  const auto& parents = commit->getParents();
  return parents.size() == 0 ? qf::zero::ModelElement() : parents.basicAt(0);
}

}  // namespace

FirstParentStates& FirstParentStates::of(qf::zero::ModelImpl& model) {
  std::shared_ptr<void>& slot = model.attachment(&kAttachmentKey);
  if (!slot) slot = std::make_shared<FirstParentStates>();
  return *static_cast<FirstParentStates*>(slot.get());
}

std::optional<ObjectStorage> FirstParentStates::find(const Commit& tip, const qf::zero::Uuid& element) {
  qf::zero::ModelImpl& model = *tip->getModelImpl();
  const bool inStep = tip_ && seenChanges_ == model.getWatchedChangeCount();
  if (!inStep || tip_ != tip) {
    if (inStep && usable_ && heldFirstParent(tip) == tip_) {
      extendTo(tip);
    } else {
      // A single question at another line is cheaper walked than indexed; the second
      // in a row pays for the index: a second question at one tip, as recording a commit
      // of several elements asks, or one at a child of the last tip asked, as recording
      // commits of one element each on a branch does.
      const bool followsLastMiss = lastMiss_ && heldFirstParent(tip) == lastMiss_;
      if (lastMiss_ != tip && !followsLastMiss) {
        lastMiss_ = tip;
        return std::nullopt;
      }
      rebuild(tip);
    }
    seenChanges_ = model.getWatchedChangeCount();
  }
  lastMiss_ = Commit();
  if (!usable_) return std::nullopt;
  const ObjectStorage* found = states_.find(element);
  if (found == nullptr) return ObjectStorage();
  if (!found->isLive()) return std::nullopt;
  return *found;
}

void FirstParentStates::extendTo(const Commit& tip) {
  watch(tip);
  tip_ = tip;
  if (absorb(tip, /*nearest=*/true)) return;
  usable_ = false;
  states_.clear();
}

// The marks of a line left behind stay: the kept snapshot states may rely on them, and a
// change there only costs a needless rebuild later.
void FirstParentStates::rebuild(const Commit& tip) {
  states_.clear();
  tip_ = tip;
  usable_ = true;
  for (Commit commit = tip;;) {
    watch(commit);
    if (!absorb(commit, /*nearest=*/false)) break;
    const Delta delta = commit->getDelta();
    if (isLive(delta) && delta->getIsSnapshot()) return;
    const qf::zero::ModelElement parent = heldFirstParent(commit);
    if (!parent || (!parent.isProxy() && !parent.isLive())) return;
    if (parent.isProxy()) break;
    commit = qf::zero::elementCast<Commit>(parent);
  }
  usable_ = false;
  states_.clear();
}

bool FirstParentStates::absorb(const Commit& commit, bool nearest) {
  const Delta delta = commit->getDelta();
  if (!isLive(delta)) return true;
  watch(delta);
  const auto& entries = delta->getCurrent().container();
  for (const auto& [key, storage] : entries) {
    if (!storage.isLive()) return false;
  }
  if (nearest && delta->getIsSnapshot()) states_.clear();
  for (const auto& [key, storage] : entries) {
    if (nearest) {
      states_.insertOrAssign(key, storage);
    } else {
      states_.tryInsert(key, storage);
    }
  }
  return true;
}

void FirstParentStates::watch(const qf::zero::ModelElement& element) { element->setWatched(true); }

}  // namespace kiv::history
