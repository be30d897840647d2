// Behaviour of the generated element classes: defaults, the setter algorithm, proxies,
// opposites and map keys, old values and rollback, builders, serializers, invokers.
#include "kiv/metamodel/branch_impl.h"
#include "kiv/metamodel/commit_impl.h"
#include "kiv/metamodel/delta_impl.h"
#include "kiv/metamodel/dependency_impl.h"
#include "kiv/metamodel/local_repository_impl.h"
#include "kiv/metamodel/meta_package_kiv.h"
#include "kiv/metamodel/object_storage_impl.h"
#include "kiv/metamodel/protocol/repo_info.h"
#include "kiv/metamodel/push_mode.h"
#include "kiv/metamodel/workspace_impl.h"
#include "qf/zero/core/listener.h"
#include "qf/zero/core/messages.h"
#include "qf/zero/core/meta/property_serializer.h"
#include "qf/zero/core/model_impl.h"
#include "qf/zero/io/json_serializer.h"
#include "support/test_metamodel.h"

#include <boost/date_time/posix_time/posix_time.hpp>
#include <boost/optional/optional_io.hpp>
#include <boost/uuid/uuid_io.hpp>

#include <gtest/gtest.h>

#include <nlohmann/json.hpp>

namespace {

using foundation::core::except::Exception;
using qf::zero::Model;
using qf::zero::ModelElement;
using qf::zero::Value;
namespace meta = qf::zero::meta;
namespace msg = qf0::messages;

using Report = std::shared_ptr<qf::zero::ShallowChangeReport<ModelElement>>;

struct Recorder : qf::zero::Listener {
  std::vector<Report> reports;
  void transactionCommitted(const Report& report) { reports.push_back(report); }
};

template <class T>
std::shared_ptr<T> fakePointer() {
  static int anchor;
  return std::shared_ptr<T>(std::shared_ptr<void>(), reinterpret_cast<T*>(&anchor));
}

class GeneratedClasses : public ::testing::Test {
 protected:
  void SetUp() override { model->addShallowListener(&recorder); }
  void TearDown() override { model->removeListener(&recorder); }

  kiv::Branch branchNamed(const std::u16string& name) {
    return kiv::Branch::Builder(model).doSetName(name).create();
  }
  template <class T>
  T proxyOf() {
    return qf::zero::elementCast<T>(ModelElement::Impl::createProxy(
        model.getImpl(), T::metaClass(), qf::zero::ProxyId{qf::zero::generateNewUuid(), u""}));
  }

  const kiv::MetaPackageKiv& package = kiv::MetaPackageKiv::getInstance();
  Model model = Model::create();
  Recorder recorder;
};

TEST_F(GeneratedClasses, NewElementsHoldTheDocumentedDefaults) {
  const kiv::Dependency dependency = kiv::Dependency::create(model);
  const kiv::Commit commit = kiv::Commit::create(model);
  EXPECT_EQ(dependency.getDepth(), -1);
  EXPECT_EQ(dependency.getPropertyValue(package.getDependency_depth()), Value::of(-1));
  EXPECT_EQ(commit.getUser(), u"");
  EXPECT_EQ(commit.getMessage(), u"");
  EXPECT_FALSE(commit.getDateTime());
  EXPECT_FALSE(commit.hasPropertyValue(package.getCommit_dateTime()));
  EXPECT_EQ(kiv::Branch::create(model).getName(), u"");
}

TEST_F(GeneratedClasses, SettingTheCurrentValueOpensNoTransaction) {
  const kiv::Commit commit = kiv::Commit::Builder(model).doSetUser(u"ann").create();
  const kiv::Branch branch = kiv::Branch::Builder(model).doSetTip(commit).create();
  recorder.reports.clear();
  commit->setUser(u"ann");
  branch->setTip(commit);
  commit->setDateTime(boost::none);
  EXPECT_TRUE(recorder.reports.empty());
  commit->setUser(u"bob");
  ASSERT_EQ(recorder.reports.size(), 1u);
  EXPECT_EQ(recorder.reports[0]->getOldValue(commit, package.getCommit_user()),
            Value::of(std::u16string(u"ann")));
}

TEST_F(GeneratedClasses, EverySetterAndMutableGetterRefusesAProxyFirst) {
  const auto commit = proxyOf<kiv::Commit>();
  const auto storage = proxyOf<kiv::ObjectStorage>();
  EXPECT_THROW(commit->setUser(u"x"), Exception<msg::CannotModifyProxy>);
  EXPECT_THROW(commit->setDelta(kiv::Delta::create(model)), Exception<msg::CannotModifyProxy>);
  EXPECT_THROW(commit->getParentsMutable(), Exception<msg::CannotModifyProxy>);
  // Before the read-only check, and before the same-value shortcut.
  EXPECT_THROW(storage->setElementUUID(qf::zero::generateNewUuid()), Exception<msg::CannotModifyProxy>);
  EXPECT_THROW(commit->setUser(u""), Exception<msg::CannotModifyProxy>);
}

TEST_F(GeneratedClasses, OppositesAndMapKeysFollowEverySetter) {
  const auto repository = kiv::LocalRepository::create(model);
  const kiv::Branch master = branchNamed(u"master");
  const kiv::Branch dev = branchNamed(u"dev");
  master->setRepository(repository);
  dev->setRepository(repository);
  const auto& branches = repository.getBranches().container();
  EXPECT_EQ(branches.at(u"master"), master);
  EXPECT_EQ(master.container(), repository) << "branches owns its branches";

  master->setName(u"main");
  EXPECT_EQ(branches.count(u"master"), 0u);
  EXPECT_EQ(branches.at(u"main"), master);

  EXPECT_THROW(dev->setName(u"main"), Exception<msg::UniquenessConstraint>);
  EXPECT_EQ(dev.getName(), u"dev");
  EXPECT_EQ(branches.at(u"dev"), dev);

  dev->setRepository({});
  EXPECT_EQ(branches.size(), 1u);
  EXPECT_FALSE(dev.container());

  const auto workspace = kiv::Workspace::create(model);
  repository->setWs(workspace);
  EXPECT_EQ(workspace.getRepository(), repository);
  EXPECT_EQ(workspace.container(), repository);
}

TEST_F(GeneratedClasses, ElementUuidIsReadOnlyAndKeysBothDeltaMaps) {
  const auto id = qf::zero::generateNewUuid();
  const auto storage = kiv::ObjectStorage::Builder(model).doSetElementUUID(id).create();
  try {
    storage->setElementUUID(qf::zero::generateNewUuid());
    FAIL() << "elementUUID changed";
  } catch (const Exception<msg::CannotSetReadOnlyProperty>& e) {
    EXPECT_NE(std::string(e.what()).find("kiv.ObjectStorage.elementUUID"), std::string::npos) << e.what();
  }
  EXPECT_EQ(storage.getElementUUID(), id);

  const auto delta = kiv::Delta::create(model);
  delta->getCurrentMutable().add(storage);
  delta->getPreviousMutable().add(storage);
  EXPECT_EQ(delta.getCurrent().container().at(id), storage);
  EXPECT_EQ(delta.getPrevious().container().at(id), storage);
  const auto twin = kiv::ObjectStorage::Builder(model).doSetElementUUID(id).create();
  EXPECT_THROW(delta->getCurrentMutable().add(twin), Exception<msg::UniquenessConstraint>);
}

TEST_F(GeneratedClasses, APropertyChangedAndChangedBackIsNoChange) {
  const kiv::Commit commit = kiv::Commit::Builder(model).doSetUser(u"ann").create();
  const kiv::Commit parent = kiv::Commit::create(model);
  recorder.reports.clear();
  {
    auto transaction = model->beginTransaction();
    commit->setUser(u"bob");
    commit->setUser(u"ann");
    commit->getParentsMutable().add(parent);
    commit->getParentsMutable().remove(parent);
    transaction.commit();
  }
  ASSERT_EQ(recorder.reports.size(), 1u);
  EXPECT_FALSE(recorder.reports[0]->isModified(commit));
  {
    auto transaction = model->beginTransaction();
    commit->setUser(u"bob");
    commit->setUser(u"ann");
    commit->setMessage(u"fix");
    transaction.commit();
  }
  ASSERT_EQ(recorder.reports.size(), 2u);
  EXPECT_TRUE(recorder.reports[1]->isModified(commit));
  EXPECT_FALSE(recorder.reports[1]->isChanged(commit, package.getCommit_user()));
  EXPECT_TRUE(recorder.reports[1]->isChanged(commit, package.getCommit_message()));
}

TEST_F(GeneratedClasses, ACancelledTransactionRestoresTheRepositoryExactly) {
  const auto when = boost::posix_time::time_from_string("2026-11-21 10:30:00");
  auto repository = kiv::LocalRepository::Builder(model).doSetName(u"repo").create();
  const kiv::Commit first = kiv::Commit::Builder(model).doSetUser(u"ann").doSetDateTime(when).create();
  const kiv::Commit second = kiv::Commit::Builder(model).doAddParents(first).doSetMessage(u"two").create();
  const kiv::Branch master = kiv::Branch::Builder(model).doSetName(u"master").doSetTip(second).create();
  const kiv::Branch dev = kiv::Branch::Builder(model).doSetName(u"dev").doSetTip(first).create();
  master->setRepository(repository);
  dev->setRepository(repository);
  repository->setHead(master);
  const auto storage =
      kiv::ObjectStorage::Builder(model).doSetElementUUID(qf::zero::generateNewUuid()).create();
  auto delta = kiv::Delta::create(model);
  delta->getCurrentMutable().add(storage);
  second->setDelta(delta);
  repository->setIMergeStrategy(fakePointer<kiv::IMergeStrategy>());
  const std::string before = support::dumpModel(model);
  {
    auto outer = model->beginTransaction();
    second->setUser(u"zed");
    first->setDateTime(boost::none);
    {
      auto inner = model->beginTransaction();  // committed: its old values join the outer ones
      dev->setName(u"feature");
      master->setTip(first);
      second->setUser(u"yan");
      second->setDelta({});
      inner.commit();
    }
    {
      auto inner = model->beginTransaction();  // cancelled alone
      first->setMessage(u"lost");
      repository->setIMergeStrategy(nullptr);
    }
    EXPECT_EQ(first.getMessage(), u"");
    EXPECT_TRUE(repository->getIMergeStrategy());
    delta.destroy();
    storage->setContent(qf::zero::JsonValue{{"a", 1}});
    repository->setWs(kiv::Workspace::create(model));
    repository->setHead(dev);
  }
  EXPECT_EQ(support::dumpModel(model), before);
  EXPECT_EQ(repository.getBranches().container().at(u"dev"), dev);
  EXPECT_EQ(second.getDelta(), delta);
  EXPECT_EQ(first.getDateTime(), when);
}

TEST_F(GeneratedClasses, BuildersCreateOwnedElementsInTheSameStepAndLeaveNothingOnError) {
  auto child = std::make_unique<kiv::Branch::Builder>();
  child->doSetName(u"master");
  const auto repository = kiv::LocalRepository::Builder(model)
                              .doSetName(u"repo")
                              .doAddBranches(std::move(child))
                              .doSetWs(std::make_unique<kiv::Workspace::Builder>())
                              .create();
  EXPECT_EQ(repository.getBranches().container().at(u"master").getRepository(), repository);
  EXPECT_EQ(repository.getWs().getRepository(), repository);

  const auto dependency = kiv::Dependency::Builder(model)
                              .doAddOldestCommits({u"a", u"b"})
                              .doClearOldestCommits()
                              .doAddOldestCommits(u"c")
                              .doAddNewestCommits(u"d")
                              .create();
  EXPECT_EQ(dependency.getOldestCommits().values(), std::vector<std::u16string>{u"c"});
  EXPECT_EQ(dependency.getNewestCommits().values(), std::vector<std::u16string>{u"d"});

  const auto count = model->getElementCount();
  auto first = std::make_unique<kiv::Branch::Builder>();
  first->doSetName(u"same");
  auto second = std::make_unique<kiv::Branch::Builder>();
  second->doSetName(u"same");
  kiv::LocalRepository::Builder failing(model);
  failing.doAddBranches(std::move(first)).doAddBranches(std::move(second));
  EXPECT_THROW(failing.create(), Exception<msg::UniquenessConstraint>);
  EXPECT_EQ(model->getElementCount(), count);
}

TEST_F(GeneratedClasses, SerializersWriteEnumsByNameRepoInfoByPropertyAndNoPointers) {
  const auto& serializers = meta::PropertySerializerRegistry::getInstance();
  const auto* pushMode = serializers.getPropertySerializer(package.getPushMode());
  ASSERT_NE(pushMode, nullptr);
  EXPECT_EQ(pushMode->toJson(Value::of(kiv::PushMode::MergeFirst)), "MergeFirst");
  EXPECT_EQ(pushMode->fromJson("TryPush", {}).getValue<kiv::PushMode>(), kiv::PushMode::TryPush);

  const auto* repoInfo = serializers.getDatatypeSerializer(package.getRepoInfo());
  ASSERT_NE(repoInfo, nullptr);
  Value info = repoInfo->setPropertyValue(repoInfo->createDefault(), package.getRepoInfo_head(),
                                          Value::of(std::u16string(u"master")));
  info = repoInfo->setPropertyValue(info, package.getRepoInfo_isBare(), Value::of(true));
  kiv::protocol::RepoInfo expected;
  expected.setIsBare(true);
  expected.setHead(u"master");
  EXPECT_TRUE(info.getValue<kiv::protocol::RepoInfo>().compareWith(expected));
  EXPECT_EQ(repoInfo->getPropertyValue(info, package.getRepoInfo_head()),
            Value::of(std::u16string(u"master")));
  EXPECT_THROW(repoInfo->getPropertyValue(info, package.getBranch_name()), Exception<msg::NoSuchProperty>);
  EXPECT_THROW(repoInfo->setPropertyValue(info, package.getBranch_name(), Value()),
               Exception<msg::NoSuchProperty>);

  const auto repository = kiv::LocalRepository::Builder(model)
                              .doSetName(u"repo")
                              .doSetIMergeStrategy(fakePointer<kiv::IMergeStrategy>())
                              .doSetPacketTransport(fakePointer<qf::zero::io::PacketTransport>())
                              .doSetNumRemoteObservers(2)
                              .create();
  const auto content = qf::zero::io::JSONSerializer().writeEntry(repository)["content"];
  EXPECT_EQ(content.value("name", ""), "repo");
  for (const char* unwritten :
       {"IMergeStrategy", "packetTransport", "numRemoteObservers", "observers", "repositoryListener"}) {
    EXPECT_FALSE(content.contains(unwritten)) << unwritten;
  }
}

TEST_F(GeneratedClasses, ReflectionFindsInheritedPropertiesInvokersAndInstances) {
  const auto repository = kiv::LocalRepository::create(model);
  EXPECT_EQ(repository->propertyForSlot(1), package.getRepository_head());
  EXPECT_EQ(repository->propertyForSlot(10), package.getLocalRepository_origin());
  EXPECT_FALSE(repository->propertyForSlot(14));

  auto dependency = kiv::Dependency::create(model);
  dependency.invoke(package.getDependency_load_operation(), {});  // no repository: nothing to load from
  dependency->setRepository(repository);
  EXPECT_NO_THROW(
      dependency.invoke(package.getDependency_load_operation(), {}));  // a local repository loads nothing
  auto commit = kiv::Commit::create(model);
  EXPECT_THROW(commit.invoke(package.getDependency_load_operation(), {}), Exception<msg::NoSuchOperation>);
  EXPECT_FALSE(package.getBranch_merge_operation()->getInvoker()) << "takes a strategy no value can hold";

  kiv::Branch::create(model);
  kiv::Branch::create(model);
  qf::zero::query::AbstractQuery query(model);
  kiv::Branch::Constrainables branches(query);
  kiv::RepositoryObserver::Constrainables exactObservers(query, kiv::RepositoryObserver::metaClass(),
                                                         qf::zero::query::SearchClassMatchMode::ExactClass);
  EXPECT_EQ(branches.getTypedInstances().size(), 2u);
  EXPECT_TRUE(exactObservers.getTypedInstances().empty()) << "an abstract class has no exact instances";
  EXPECT_EQ(kiv::Repository::Constrainables(query).getTypedInstances(),
            std::vector<kiv::Repository>{repository});
}

TEST_F(GeneratedClasses, ConvertingReferencesToProxiesDropsWhatTheElementDoesNotOwn) {
  const auto delta = kiv::Delta::create(model);
  const auto parent = kiv::Commit::create(model);
  const auto commit = kiv::Commit::Builder(model).doSetDelta(delta).doAddParents(parent).create();
  boost::optional<qf::zero::ProxyId> id;
  commit->convertReferencesToProxies(false, id);
  EXPECT_FALSE(commit.getDelta());
  EXPECT_EQ(commit.getParents().size(), 0u);
  EXPECT_TRUE(delta->incomingReferences().empty());
  EXPECT_TRUE(parent->incomingReferences().empty());
}

}  // namespace
