// RepositoryListener: watches one repository's branches and tells its observers when a
// committed transaction of the repository model changed them.
//
// A repository makes its listener when it gains an observer (addRepositoryObserver) and
// keeps it in its transient "repositoryListener" property; the listener is a deep listener
// of the repository model. After each committed transaction that touched the repository
// or one of its branches, it compares the branch states (name, tip, redo stack) with those
// it recorded last; when they differ, the recorded states move to `previous`, the new
// ones become `current`, and the repository's notifyObservers() runs once.
//
// Threads: the callback runs on the thread that committed the transaction. A transaction
// committed while the listener is still notifying (by an observer pulling into the same
// model, for instance) is not looked at: a busy flag guards re-entry, and a change it hid
// is seen by the next transaction.
#pragma once

#include "kiv/metamodel/protocol/history.h"
#include "kiv/metamodel/repository.h"
#include "qf/zero/core/change_report.h"
#include "qf/zero/core/listener.h"
#include "qf/zero/core/uuid.h"

#include <map>
#include <memory>
#include <string>
#include <vector>

namespace kiv {

// A repository's watch on its own branches: after a committed transaction that changed them it
// records their new states and notifies the observers once. Made by the repository when it
// gains an observer.
class RepositoryListener : public qf::zero::Listener {
 public:
  using Report = qf::zero::DeepChangeReport<qf::zero::ModelElement>;

  // The state of one branch as an observer sees it.
  struct BranchState {
    qf::zero::Uuid tip;
    std::vector<qf::zero::Uuid> redoStack;
    friend bool operator==(const BranchState&, const BranchState&) = default;
  };
  using BranchStates = std::map<std::u16string, BranchState>;

  // Records the repository's branch states as both previous and current. `history` is
  // the element the listener was made with; the listener does not own it.
  RepositoryListener(Repository repository, protocol::History history);
  // Unregisters from the repository model.
  ~RepositoryListener() override;
  RepositoryListener(const RepositoryListener&) = delete;
  RepositoryListener& operator=(const RepositoryListener&) = delete;

  // Registers as a deep listener of the repository's model.
  void attach();

  void transactionCommitted(const std::shared_ptr<Report>& report);

  const Repository& getRepository() const noexcept { return repository_; }
  const protocol::History& getHistory() const noexcept { return history_; }
  const BranchStates& getPrevious() const noexcept { return previous_; }
  const BranchStates& getCurrent() const noexcept { return current_; }
  // True once a change of the branches has been seen.
  bool isModified() const noexcept { return modified_; }

  // The branch states of `repository` now.
  static BranchStates statesOf(const Repository& repository);

 private:
  bool touchesRepository(const Report& report) const;

  Repository repository_;
  protocol::History history_;
  BranchStates previous_;
  BranchStates current_;
  bool registered_ = false;
  bool busy_ = false;
  bool modified_ = false;
};

}  // namespace kiv
