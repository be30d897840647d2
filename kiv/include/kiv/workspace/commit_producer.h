// CommitProducer: turns each committed transaction of a user model into one commit of
// the workspace's repository, and rewrites the user model without making commits.
//
//   auto producer = std::make_shared<kiv::CommitProducer>(workspace, userModel);
//   producer->attach();                 // now every committed user transaction is a commit
//   producer->update(delta);            // applies a delta; no commit is made for it
//
// A workspace makes its producer in `init` and holds the only shared pointer to it; the
// producer holds counted references to the workspace and the user model. The user model
// holds the producer's listener registration, never the producer: the destructor
// unregisters it.
//
// Threads: the producer runs on the thread that commits the user transaction. Its
// `enabled` flag is the only guard against its own rewrites, so the user model and the
// repository model must be used from one thread at a time.
#pragma once

#include "kiv/metamodel/commit.h"
#include "kiv/metamodel/workspace.h"
#include "qf/zero/core/change_report.h"
#include "qf/zero/core/listener.h"
#include "qf/zero/core/model.h"
#include "qf/zero/core/transaction.h"

#include <memory>
#include <optional>

namespace kiv {

// Records each committed transaction of the user model as one commit of the workspace's head,
// except the rewrites it makes itself. A workspace makes and owns it; the user model and the
// repository model it writes are used from one thread at a time.
class CommitProducer : public qf::zero::Listener {
 public:
  using Report = qf::zero::ShallowChangeReport<qf::zero::ModelElement>;

  // Disabled and unregistered until `attach`.
  CommitProducer(Workspace workspace, qf::zero::Model model);
  ~CommitProducer() override;
  CommitProducer(const CommitProducer&) = delete;
  CommitProducer& operator=(const CommitProducer&) = delete;

  // Registers on the user model (when there is one) and enables production.
  void attach();

  // A committed user transaction becomes one commit in the repository model whose parent
  // is the head tip: created and modified elements are stored anew; a destroyed element's
  // last content is taken from history. A transaction that changed nothing still makes a
  // commit. The workspace then appends it to the head; when the workspace's context is
  // behind the head, "CannotCommit" reaches the committer after the commit was made,
  // unattached to any branch.
  //
  // The commit is made while the user transaction is validated, in a repository
  // transaction that is prepared then and committed once the user transaction has
  // committed: a veto of the repository transaction vetoes the user's, and a veto of the
  // user's cancels the commit. Nothing is recorded while production is disabled.
  void validateOnCommit(const std::shared_ptr<Report>& report);
  void transactionCommitted(const std::shared_ptr<Report>& report);
  void transactionCanceled(bool vetoed, const std::shared_ptr<Report>& report);

  // An open user transaction in which the producer makes no commit. The workspace rewrites
  // the user model inside one and commits it together with its repository transaction
  // (prepare both, then commit both), so that a veto of either changes neither model.
  // Destruction cancels the transaction when it is still open, then production resumes
  // as it was.
  class Rewrite {
   public:
    explicit Rewrite(CommitProducer& producer);
    ~Rewrite();
    Rewrite(const Rewrite&) = delete;
    Rewrite& operator=(const Rewrite&) = delete;

    void update(const Delta& delta);
    void clearModel();
    void replaceState(const Delta& state);
    qf::zero::Transaction& transaction() noexcept { return transaction_; }

   private:
    CommitProducer& producer_;
    bool saved_;
    qf::zero::Transaction transaction_;
  };

  // Destroys every top-level element of the user model in one user transaction, without
  // making a commit.
  void clearModel();
  // Applies `delta` to the user model in one user transaction, without making a commit.
  // A failure leaves the user model as it was.
  void update(const Delta& delta);
  // Makes the user model hold exactly the elements of `state` (a whole state, such as a
  // snapshot), in one user transaction and without making a commit: elements that `state`
  // lacks are destroyed, the others are made or refreshed in place, so that handles to
  // kept elements stay valid.
  void replaceState(const Delta& state);

  // Takes the other producer's workspace, model and state; registers on the model when the
  // other one was enabled.
  void copyFrom(const CommitProducer& other);

  bool isEnabled() const noexcept { return enabled_; }
  const Workspace& getWorkspace() const noexcept { return workspace_; }
  const qf::zero::Model& getModel() const noexcept { return model_; }

 private:
  void detach() noexcept;
  // Makes the commit of `report` in the open repository transaction.
  Commit record(const Report& report) const;

  // The commit made while validating, waiting for the user transaction to commit.
  struct Pending {
    qf::zero::Transaction transaction;
    Commit commit;
    bool attached = false;
    std::shared_ptr<Report> report;
  };

  Workspace workspace_;
  qf::zero::Model model_;
  bool enabled_ = false;
  bool registered_ = false;
  std::optional<Pending> pending_;
};

}  // namespace kiv
