// Set-up shared by the repository and workspace tests: a repository model holding a bare
// origin and its clones, each clone with a workspace over a user model of the test
// metamodel, and the states of user models as serialised entries.
#pragma once

#include "kiv/kiv.h"
#include "kiv/repository/notice_executor.h"
#include "kiv/workspace/commit_producer.h"
#include "kiv/workspace/load_context.h"
#include "support/json_documents.h"
#include "support/test_metamodel.h"

#include <gtest/gtest.h>

#include <nlohmann/json.hpp>

#include <chrono>
#include <future>
#include <map>
#include <string>
#include <vector>

namespace repository_test {

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

// A workspace over its own user model.
struct Clone {
  Model user = Model::create();
  kiv::LocalRepository repository;
  kiv::Workspace workspace;

  kiv::Branch head() const { return repository->getHead(); }
  kiv::Commit tip() const { return head()->getTip(); }
};

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

  // A new Node named `name`, made in one user transaction of `clone` (one commit).
  ModelElement addNode(Clone& clone, const std::u16string& name) {
    ModelElement node;
    clone.workspace->commitTransaction([&] {
      node = tm.node.instantiate(clone.user);
      tm.setName(node, name);
    });
    return node;
  }

  void rename(Clone& clone, ModelElement node, const std::u16string& name) {
    clone.workspace->commitTransaction([&] { tm.setName(node, name); });
  }

  support::TestMetamodel tm;
  Model repositories = Model::create();
  Model originUser = Model::create();
  kiv::LocalRepository origin;
};

// Waits for a future at most `limit`; a test that hangs fails instead.
inline bool finishes(std::future<void>& pending, std::chrono::seconds limit = std::chrono::seconds(30)) {
  return pending.wait_for(limit) == std::future_status::ready;
}

}  // namespace repository_test
