// Helpers of the workspace tests: injected failures (a listener that vetoes a chosen
// transaction, a merge strategy that throws), a recorder of the user model's state at each
// commit its workspace produces, and the text of both models a workspace touches.
#pragma once

#include "kiv/merge/merge_strategy.h"
#include "kiv/metamodel/local_repository_impl.h"
#include "kiv/repository/repository_fixture.h"
#include "qf/zero/core/listener.h"
#include "qf/zero/core/model_impl.h"
#include "qf/zero/core/transaction.h"

#include <memory>
#include <stdexcept>
#include <string>
#include <unordered_map>

namespace workspace_test {

using namespace repository_test;
using foundation::core::except::Exception;
using repository_test::PrintTo;  // table rows print by name
using Report = qf::zero::ShallowChangeReport<ModelElement>;

// What every injected failure throws.
struct Injected : std::runtime_error {
  Injected() : std::runtime_error("injected failure") {}
};

// Listens to one model while it lives and counts the outermost transactions that reach
// validation; vetoes the `vetoAt`-th of them (counted from 1; 0 vetoes none).
class Veto : public qf::zero::Listener {
 public:
  explicit Veto(Model model, int vetoAt = 0) : model_(std::move(model)), vetoAt_(vetoAt) {
    model_->addShallowListener(this);
  }
  ~Veto() override { model_->removeListener(this); }
  Veto(const Veto&) = delete;
  Veto& operator=(const Veto&) = delete;

  void validateOnCommit(const std::shared_ptr<Report>& /*report*/) {
    if (++seen_ == vetoAt_) throw Injected();
  }
  int seen() const { return seen_; }

 private:
  Model model_;
  int vetoAt_;
  int seen_ = 0;
};

class FailingStrategy : public kiv::IMergeStrategy {
 public:
  kiv::Commit run(const kiv::Commit& /*ours*/, const kiv::Commit& /*theirs*/) const override {
    throw Injected();
  }
};

inline void installStrategy(const kiv::LocalRepository& repository,
                            std::shared_ptr<kiv::IMergeStrategy> strategy) {
  qf::zero::Transaction transaction = repository.getModel()->beginTransaction();
  repository->setIMergeStrategy(std::move(strategy));
  transaction.commit();
}

// The repository model and one user model as text: equal before and after an operation
// that changed neither.
struct Dumps {
  std::string repositories;
  std::string user;
  friend bool operator==(const Dumps&, const Dumps&) = default;
};

inline Dumps dumpsOf(const Model& repositories, const Model& user) {
  return {dumpOf(repositories), dumpOf(user)};
}

inline std::size_t commitCount(const Model& repositories) {
  return repositories
      ->getInstances(kiv::Commit::metaClass(), qf::zero::query::SearchClassMatchMode::IncludeSubclasses)
      .size();
}

// The state of a clone's user model after each commit its workspace produces, by commit;
// the null commit stands for the empty model. Registered after the workspace's producer,
// so it runs once the commit is on the head. Stop `recording` before rewriting the model
// through the workspace, or the rewrites would be recorded as the states to expect.
class StateRecorder : public qf::zero::Listener {
 public:
  explicit StateRecorder(Clone& clone) : clone_(clone) {
    states_[kiv::Commit()] = State();
    clone_.user->addShallowListener(this);
  }
  ~StateRecorder() override { clone_.user->removeListener(this); }
  StateRecorder(const StateRecorder&) = delete;
  StateRecorder& operator=(const StateRecorder&) = delete;

  void transactionCommitted(const std::shared_ptr<Report>& /*report*/) {
    if (recording) record();
  }

  // For commits that leave the user model as it is (a snapshot).
  void record() { states_[clone_.tip()] = stateOf(clone_.user); }

  const std::unordered_map<kiv::Commit, State>& states() const { return states_; }
  const State& at(const kiv::Commit& commit) const { return states_.at(commit); }

  bool recording = true;

 private:
  Clone& clone_;
  std::unordered_map<kiv::Commit, State> states_;
};

// Names the rows of a table after their `name` member.
struct RowName {
  template <class Row>
  std::string operator()(const ::testing::TestParamInfo<Row>& info) const {
    return info.param.name;
  }
};

}  // namespace workspace_test
