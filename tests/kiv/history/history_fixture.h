// Set-up shared by the history tests: the models a test works in, storages and deltas
// built by hand, and histories of a small user model recorded as commits.
//
// A user transaction becomes one commit the way the library's commit producer makes
// them: created and modified elements are stored anew, a destroyed element's last state
// is taken from history. States are kept as serialised documents for comparison.
#pragma once

#include "kiv/history/element_reuse_model_builder.h"
#include "kiv/messages/messages.h"
#include "kiv/metamodel/commit_impl.h"
#include "kiv/metamodel/delta_impl.h"
#include "kiv/metamodel/object_storage_impl.h"
#include "qf/zero/core/change_report.h"
#include "qf/zero/core/listener.h"
#include "qf/zero/core/messages.h"
#include "qf/zero/core/model_impl.h"
#include "qf/zero/io/json_change_report_synchronizer.h"
#include "qf/zero/io/json_parser.h"
#include "support/json_documents.h"
#include "support/test_metamodel.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <nlohmann/json.hpp>

#include <functional>
#include <map>
#include <memory>
#include <ostream>
#include <string>
#include <vector>

// Failures show a storage by its state.
namespace kiv {
inline void PrintTo(const ObjectStorage& storage, std::ostream* out) {
  if (!storage) {
    *out << "no storage";
  } else if (!storage.isLive()) {
    *out << (storage.isProxy() ? "proxy " : "destroyed storage ") << storage.identifier();
  } else {
    *out << "storage " << storage.getContent().dump();
  }
}
}  // namespace kiv

namespace history_test {

using foundation::core::except::Exception;
using qf::zero::JsonValue;
using qf::zero::Model;
using qf::zero::ModelElement;
using qf::zero::Uuid;
using StorageMap = std::map<Uuid, kiv::ObjectStorage>;

// A storage of `element` whose content is just a label for its state.
inline kiv::ObjectStorage storageOf(const Model& model, const Uuid& element, const std::string& state) {
  return kiv::ObjectStorage::Builder(model)
      .doSetElementUUID(element)
      .doSetContent(JsonValue{{"state", state}})
      .create();
}

inline StorageMap previousOf(const kiv::Delta& delta) { return delta.getPrevious().container(); }
inline StorageMap currentOf(const kiv::Delta& delta) { return delta.getCurrent().container(); }

// Names the rows of a table after their `name` member.
struct CaseName {
  template <class Case>
  std::string operator()(const ::testing::TestParamInfo<Case>& info) const {
    return info.param.name;
  }
};

// A repository, a user model of the test metamodel, a second repository for copies,
// and three element UUIDs. Members are public so that table rows can reach them.
struct HistoryModels {
  ModelElement nodeNamed(const std::u16string& name) { return named(tm.node, name); }
  ModelElement gadgetNamed(const std::u16string& name) { return named(tm.gadget, name); }
  ModelElement named(const qf::zero::meta::Class& type, const std::u16string& name) {
    ModelElement element = type.instantiate(user);
    tm.setName(element, name);
    return element;
  }
  kiv::ObjectStorage stored(const Uuid& element, const std::string& state) {
    return storageOf(repository, element, state);
  }

  support::TestMetamodel tm;
  Model repository = Model::create();
  Model user = Model::create();
  Model elsewhere = Model::create();
  const Uuid a = qf::zero::generateNewUuid(), b = qf::zero::generateNewUuid(),
             c = qf::zero::generateNewUuid();
};

class HistoryTest : public ::testing::Test, public HistoryModels {};

// Turns the next committed transaction of a user model into a commit with the given
// parents, in the repository model.
class CommitRecorder : public qf::zero::Listener {
 public:
  CommitRecorder(Model repository, std::vector<kiv::Commit> parents)
      : repository_(std::move(repository)), parents_(std::move(parents)) {}

  void transactionCommitted(const std::shared_ptr<qf::zero::ShallowChangeReport<ModelElement>>& report) {
    qf::zero::Transaction transaction = repository_->beginTransaction();
    commit_ = kiv::Commit::create(repository_);
    for (const kiv::Commit& parent : parents_) commit_->addParent(parent);
    for (const ModelElement& element : report->getAdded()) commit_->addCreated(element);
    for (const ModelElement& element : report->getModified()) commit_->addUpdated(element);
    for (const ModelElement& element : report->getDestroyed()) {
      if (!commit_->getDelta()) commit_->setDelta(kiv::Delta::create(repository_));
      commit_->getDelta()->addDeleted(commit_->find(element.getUuid()));
    }
    transaction.commit();
  }

  const kiv::Commit& commit() const { return commit_; }

 private:
  Model repository_;
  std::vector<kiv::Commit> parents_;
  kiv::Commit commit_;
};

// Runs `edit` in one transaction of `user` and records it as a commit with `parents`.
inline kiv::Commit record(const Model& repository, const Model& user, std::vector<kiv::Commit> parents,
                          const std::function<void()>& edit) {
  CommitRecorder recorder(repository, std::move(parents));
  user->addShallowListener(&recorder);
  {
    qf::zero::Transaction transaction = user->beginTransaction();
    edit();
    transaction.commit();
  }
  user->removeListener(&recorder);
  return recorder.commit();
}

// The state of a model as its entries by id: equal for equal models whatever the
// order in which elements were made.
inline std::map<std::string, JsonValue> stateOf(const Model& model) {
  return support::entriesById(support::serializeModel(model));
}

inline Model modelFromDocument(const JsonValue& document) {
  Model model = Model::create();
  qf::zero::io::JSONParser().parseVerbatim(document, model);
  return model;
}

// Applies a delta to a user model as a change report.
inline void apply(const kiv::Delta& delta, const Model& user) {
  qf::zero::io::JSONChangeReportSynchronizer::applyChangeReportVerbatim(
      delta->toChangeReport(), user, std::make_unique<kiv::ElementReuseModelBuilder>());
}

}  // namespace history_test
