// Set-up shared by the repository and workspace tests: a repository model holding a bare
// origin and its clones, each clone with a workspace over a user model of the test
// metamodel, and the states of user models as serialised entries.
#pragma once

#include "kiv/kiv.h"
#include "kiv/messages/messages.h"
#include "kiv/metamodel/branch_impl.h"
#include "kiv/metamodel/commit_impl.h"
#include "kiv/metamodel/local_repository_impl.h"
#include "kiv/repository/notice_executor.h"
#include "kiv/workspace/commit_producer.h"
#include "kiv/workspace/load_context.h"
#include "support/json_documents.h"
#include "support/test_metamodel.h"

#include <gtest/gtest.h>

#include <nlohmann/json.hpp>

#include <chrono>
#include <concepts>
#include <future>
#include <map>
#include <ostream>
#include <string>
#include <utility>
#include <vector>

namespace repository_test {

using foundation::core::except::Exception;
using qf::zero::JsonValue;
using qf::zero::Model;
using qf::zero::ModelElement;
using State = std::map<std::string, JsonValue>;

// The state of a model as its entries by id: equal for equal models whatever the order
// in which elements were made.
inline State stateOf(const Model& model) { return support::entriesById(support::serializeModel(model)); }

// The whole repository model as text: equal before and after an operation that changed
// nothing.
inline std::string dumpOf(const Model& model) { return support::serializeModel(model).dump(); }

// Runs `action` and passes when it raises exactly `expected`, arguments included.
template <class M, class F>
::testing::AssertionResult raises(F&& action, const M& expected) {
  try {
    action();
  } catch (const Exception<M>& raised) {
    if (raised.getMessage().id() == expected.id()) return ::testing::AssertionSuccess();
    return ::testing::AssertionFailure()
           << "raised " << raised.what() << ", expected " << expected.id().render();
  } catch (const std::exception& other) {
    return ::testing::AssertionFailure()
           << "raised " << other.what() << ", expected " << expected.id().render();
  }
  return ::testing::AssertionFailure() << "raised nothing, expected " << expected.id().render();
}

// Names the rows of a table after their `name` member.
struct CaseName {
  template <class Case>
  std::string operator()(const ::testing::TestParamInfo<Case>& info) const {
    return info.param.name;
  }
};

// Prints a table row by its name; a test file brings it in with `using repository_test::PrintTo;`
// beside its rows.
template <class Row>
requires requires(const Row& row) {
  { row.name } -> std::convertible_to<std::string>;
}
void PrintTo(const Row& row, std::ostream* out) { *out << row.name; }

// A branch as a table row gives it: its name, the label of its tip ("" for none) and the
// labels of its redo stack, bottom first.
struct BranchShape {
  std::u16string name;
  std::string tip;
  std::vector<std::string> redo = {};
};

// A workspace over its own user model.
struct Clone {
  Model user = Model::create();
  kiv::LocalRepository repository;
  kiv::Workspace workspace;

  kiv::Branch head() const { return repository->getHead(); }
  kiv::Commit tip() const { return head()->getTip(); }
};

// A new Node named `name`, made in one user transaction of `clone` (one commit). Any
// clone with a user model and a workspace will do, in process or over a transport.
template <class AnyClone>
ModelElement addNodeTo(const support::TestMetamodel& tm, AnyClone& clone, const std::u16string& name) {
  ModelElement node;
  clone.workspace->commitTransaction([&] {
    node = tm.node.instantiate(clone.user);
    tm.setName(node, name);
  });
  return node;
}

// One repository model with a bare origin made by init, and clones of it.
class RepositoryModels {
 public:
  RepositoryModels() {
    kiv::MetaPackageKiv::getInstance();
    origin = kiv::LocalRepository::create(repositories, originUser);
    origin->init(kiv::RepoType::Bare);
  }

  Clone cloneOrigin() {
    Clone clone;
    clone.repository = kiv::LocalRepository::clone(origin, kiv::RepoType::Regular);
    clone.workspace = clone.repository->getWorkspace(clone.user);
    kiv::loadContext(clone.workspace);
    return clone;
  }

  ModelElement addNode(Clone& clone, const std::u16string& name) { return addNodeTo(tm, clone, name); }

  void rename(Clone& clone, ModelElement node, const std::u16string& name) {
    clone.workspace->commitTransaction([&] { tm.setName(node, name); });
  }

  // The commit a label stands for: made on first use in the repository model, without
  // parents, so that rows can give branches the same or different tips by name.
  kiv::Commit commitLabelled(const std::string& label) {
    auto found = labelled.find(label);
    if (found == labelled.end()) {
      qf::zero::Transaction transaction = repositories->beginTransaction();
      found = labelled.emplace(label, kiv::Commit::create(repositories)).first;
      transaction.commit();
    }
    return found->second;
  }

  // A branch of the repository model that belongs to no repository.
  kiv::Branch makeBranch(const BranchShape& shape) {
    std::vector<kiv::Commit> redo;
    for (const std::string& label : shape.redo) redo.push_back(commitLabelled(label));
    const kiv::Commit tip = shape.tip.empty() ? kiv::Commit() : commitLabelled(shape.tip);
    qf::zero::Transaction transaction = repositories->beginTransaction();
    const kiv::Branch branch = kiv::Branch::create(repositories);
    branch->setName(shape.name);
    if (tip) branch->setTip(tip);
    for (const kiv::Commit& commit : redo) branch->getRedoStackMutable().add(commit);
    transaction.commit();
    return branch;
  }

  // A repository of the repository model with these branches and the one named `head` (if
  // any) as head; it has no origin and no workspace.
  kiv::LocalRepository makeRepository(const std::vector<BranchShape>& branches,
                                      const std::u16string& head = u"") {
    std::vector<kiv::Branch> made;
    for (const BranchShape& shape : branches) made.push_back(makeBranch(shape));
    qf::zero::Transaction transaction = repositories->beginTransaction();
    const kiv::LocalRepository repository = kiv::LocalRepository::create(repositories);
    for (const kiv::Branch& branch : made) {
      repository->add(branch);
      if (branch->getName() == head) repository->setHead(branch);
    }
    transaction.commit();
    return repository;
  }

  // The names of a repository's branches, in name order.
  static std::vector<std::u16string> branchNames(const kiv::Repository& repository) {
    std::vector<std::u16string> names;
    for (const auto& [name, branch] : repository->getBranches().container()) names.push_back(name);
    return names;
  }

  support::TestMetamodel tm;
  Model repositories = Model::create();
  Model originUser = Model::create();
  kiv::LocalRepository origin;
  std::map<std::string, kiv::Commit> labelled;
};

// Waits for a future at most `limit`; a test that hangs fails instead.
inline bool finishes(std::future<void>& pending, std::chrono::seconds limit = std::chrono::seconds(30)) {
  return pending.wait_for(limit) == std::future_status::ready;
}

// Waits for a push or pull at most 30 s; passes when it ended without raising.
inline ::testing::AssertionResult completes(std::future<void> pending) {
  if (!finishes(pending)) return ::testing::AssertionFailure() << "still running after 30 s";
  try {
    pending.get();
  } catch (const std::exception& raised) {
    return ::testing::AssertionFailure() << "raised " << raised.what();
  }
  return ::testing::AssertionSuccess();
}

}  // namespace repository_test
