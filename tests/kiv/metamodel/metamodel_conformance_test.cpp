// The kiv metamodel as registered by MetaPackageKiv, walked through the framework's
// registry and compared in both directions (nothing missing, nothing extra) with tables
// of the documented metamodel: packages, classes, properties, operations, enumerations,
// data and primitive types, and the fixed UUIDs of the metamodel items.
#include "kiv/metamodel/meta_package_kiv.h"
#include "qf/zero/core/meta/enum.h"
#include "qf/zero/core/meta/meta_registry.h"
#include "qf/zero/core/text.h"
#include "qf/zero/core/uuid.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <functional>
#include <map>
#include <set>
#include <string>
#include <utility>
#include <vector>

namespace {

namespace meta = qf::zero::meta;
using meta::ValueFlags;
using qf::zero::toUtf16;
using qf::zero::toUtf8;
using qf::zero::Uuid;

constexpr char kRootUri[] = "/qf0/kiv/19700101";

struct ClassRow {
  const char* name;  // qualified
  const char* package;
  const char* superclass;
  bool isAbstract;
};

const ClassRow kClasses[] = {
    {"kiv.Branch", "kiv", "ModelElement", false},
    {"kiv.Commit", "kiv", "ModelElement", false},
    {"kiv.Delta", "kiv", "ModelElement", false},
    {"kiv.Dependency", "kiv", "ModelElement", false},
    {"kiv.LocalRepository", "kiv", "kiv.Repository", false},
    {"kiv.ObjectStorage", "kiv", "ModelElement", false},
    {"kiv.RemoteRepository", "kiv", "kiv.Repository", false},
    {"kiv.Repository", "kiv", "kiv.RepositoryObserver", true},
    {"kiv.RepositoryObserver", "kiv", "ModelElement", true},
    {"kiv.Workspace", "kiv", "ModelElement", false},
    {"kiv.protocol.History", "kiv.protocol", "ModelElement", false},
};

constexpr char kRepoInfo[] = "kiv.protocol.RepoInfo";

enum Flag : unsigned {
  Composite = 1,
  ReadOnly = 2,
  SetOnce = 4,
  Transient = 8,
  NotPublicGet = 16,
  NotPublicSet = 32
};

constexpr ValueFlags Opt = ValueFlags::Optional, One = ValueFlags::Single, Seq = ValueFlags::Sequence,
                     Set = ValueFlags::Set, Map = ValueFlags::Map;

struct PropertyRow {
  const char* owner;  // qualified class or datatype
  int index;
  const char* name;
  ValueFlags kind;
  const char* type;  // qualified
  unsigned flags = 0;
  const char* defaultText = nullptr;  // nullptr: none
  const char* opposite = nullptr;     // qualified property
  const char* key = nullptr;          // qualified key property of a map
};

constexpr char kStorageKey[] = "kiv.ObjectStorage.elementUUID";

const PropertyRow kProperties[] = {
    {"kiv.Branch", 1, "redoStack", Seq, "kiv.Commit"},
    {"kiv.Branch", 2, "name", One, "String", 0, ""},
    {"kiv.Branch", 3, "tip", One, "kiv.Commit"},
    {"kiv.Branch", 4, "repository", One, "kiv.Repository", 0, nullptr, "kiv.Repository.branches"},
    {"kiv.Commit", 1, "delta", One, "kiv.Delta"},
    {"kiv.Commit", 2, "user", One, "String", 0, ""},
    {"kiv.Commit", 3, "message", One, "String", 0, ""},
    {"kiv.Commit", 4, "dateTime", Opt, "DateTime"},
    {"kiv.Commit", 5, "parents", Seq, "kiv.Commit"},
    {"kiv.Delta", 1, "previous", Map, "kiv.ObjectStorage", 0, nullptr, nullptr, kStorageKey},
    {"kiv.Delta", 2, "current", Map, "kiv.ObjectStorage", 0, nullptr, nullptr, kStorageKey},
    {"kiv.Delta", 3, "isSnapshot", One, "Boolean"},
    {"kiv.Dependency", 1, "oldestCommits", Set, "String"},
    {"kiv.Dependency", 2, "depth", One, "Integer", 0, "-1"},
    {"kiv.Dependency", 3, "isSnapshot", One, "Boolean"},
    {"kiv.Dependency", 4, "newestCommits", Set, "String"},
    {"kiv.Dependency", 5, "repository", One, "kiv.Repository"},
    {"kiv.Repository", 1, "head", One, "kiv.Branch"},
    {"kiv.Repository", 2, "branches", Map, "kiv.Branch", Composite, nullptr, "kiv.Branch.repository",
     "kiv.Branch.name"},
    {"kiv.Repository", 3, "name", One, "String"},
    {"kiv.Repository", 4, "uri", One, "String"},
    {"kiv.Repository", 5, "isBare", One, "Boolean", NotPublicSet},
    {"kiv.Repository", 6, "packetTransport", One, "kiv.PacketTransportPtr"},
    {"kiv.Repository", 7, "observers", Set, "kiv.RepositoryObserver", Transient},
    {"kiv.Repository", 8, "numRemoteObservers", One, "Integer", Transient},
    {"kiv.Repository", 9, "repositoryListener", One, "kiv.RepositoryListenerPtr", Transient},
    {"kiv.LocalRepository", 10, "origin", One, "kiv.Repository", NotPublicSet},
    {"kiv.LocalRepository", 11, "pulRequests", Seq, "kiv.Dependency"},
    {"kiv.LocalRepository", 12, "IMergeStrategy", One, "kiv.IMergeStrategyPtr"},
    {"kiv.LocalRepository", 13, "ws", One, "kiv.Workspace", Composite | NotPublicSet, nullptr,
     "kiv.Workspace.repository"},
    {"kiv.ObjectStorage", 1, "elementUUID", Opt, "UUID", ReadOnly | SetOnce},
    {"kiv.ObjectStorage", 2, "content", One, "JsonValue"},
    {"kiv.Workspace", 1, "commitProducer", One, "kiv.CommitProducerPtr",
     Transient | NotPublicGet | NotPublicSet},
    {"kiv.Workspace", 2, "ctx", One, "kiv.Commit", NotPublicSet},
    {"kiv.Workspace", 3, "repository", One, "kiv.LocalRepository", NotPublicSet, nullptr,
     "kiv.LocalRepository.ws"},
    {"kiv.protocol.History", 1, "previous", Set, "kiv.Branch"},
    {"kiv.protocol.History", 2, "current", Set, "kiv.Branch"},
    {"kiv.protocol.History", 3, "commits", Set, "kiv.Commit"},
    {"kiv.protocol.History", 4, "deltas", Set, "kiv.Delta"},
    {"kiv.protocol.History", 5, "objectStorages", Set, "kiv.ObjectStorage"},
    {kRepoInfo, 1, "isBare", One, "Boolean"},
    {kRepoInfo, 2, "head", One, "String"},
};

struct Op {
  const char* name;
  std::vector<std::string> arguments = {};
};
struct ClassOperations {
  const char* owner;
  std::vector<Op> operations;
};

const std::vector<ClassOperations> kOperations = {
    {"kiv.Branch",
     {{"isEmpty"},
      {"canUndo"},
      {"canRedo"},
      {"undo"},
      {"redo"},
      {"commit", {"commit"}},
      {"clone", {"model"}},
      {"isEquivalent", {"branch", "deep"}},
      {"canCommit", {"commit"}},
      {"update", {"src"}},
      {"isPredecessorOf", {"branch"}},
      {"merge", {"src", "ms"}},
      {"findCommitByUUID", {"commit"}},
      {"areBranchMapsEquivalent", {"bm1", "bm2"}}}},
    {"kiv.Commit",
     {{"isInitial"},
      {"isMerge"},
      {"isEmpty"},
      {"getParent"},
      {"addParent", {"parent"}},
      {"diff", {"predecessor"}},
      {"findPath", {"predecessor"}},
      {"getSnapshot"},
      {"addCreated", {"current"}},
      {"addUpdated", {"current"}},
      {"addDeleted", {"current"}},
      {"find", {"uuid"}},
      {"isPredecessorOf", {"commit"}},
      {"findAllPaths"},
      {"selectInRange", {"predecessors", "commits", "result"}},
      {"select", {"commits", "result", "depth"}},
      {"findPathHelper", {"pred"}},
      {"isEqual", {"commit"}},
      {"wipeOut"}}},
    {"kiv.Delta",
     {{"isEmpty"},
      {"getCurrent", {"uuid"}},
      {"getPrevious", {"uuid"}},
      {"addCreated", {"current"}},
      {"addUpdated", {"previous", "current"}},
      {"addDeleted", {"previous"}},
      {"isCreated", {"uuid"}},
      {"isUpdated", {"uuid"}},
      {"isDeleted", {"uuid"}},
      {"compose", {"deltas"}},
      {"invert"},
      {"setPrevious", {"delta"}},
      {"addUpdated", {"current"}},
      {"isEqual", {"delta"}},
      {"toChangeReport"}}},
    {"kiv.Dependency", {{"load"}}},
    {"kiv.LocalRepository",
     {{"collectGarbage"},
      {"init", {"repoType"}},
      {"clone", {"repoType"}},
      {"push", {"mode"}},
      {"pull"},
      {"tailChop", {"tail"}},
      {"getWorkspace", {"model"}},
      {"setDefaultMergeStrategy"},
      {"checkout", {"branch"}},
      {"clone", {"origin", "repoType"}},
      {"create", {"kivModel", "baseModel"}},
      {"synchronousPush", {"mode"}},
      {"synchronousPull"},
      {"startObservingOrigin"},
      {"stopObservingOrigin"}}},
    {"kiv.ObjectStorage",
     {{"setContent", {"element"}}, {"isEmpty"}, {"instantiate", {"model"}}, {"isEqual", {"os"}}}},
    {"kiv.RemoteRepository",
     {{"clone", {"repoType"}},
      {"pushObjects", {"history"}},
      {"pullObjects"},
      {"pullRepoInfo"},
      {"synchronousClone", {"repoType"}},
      {"addRepositoryObserver", {"observer"}},
      {"removeRepositoryObserver", {"observer"}}}},
    {"kiv.Repository",
     {{"isEmpty"},
      {"add", {"branch"}},
      {"load", {"history"}},
      {"requestPull", {"src"}},
      {"remove", {"branch"}},
      {"sync", {"src", "f"}},
      {"setSynchronizationChannel", {"channel"}},
      {"setOnReceive"},
      {"canCheckout", {"branch"}},
      {"syncCreated", {"src", "f"}},
      {"syncUpdated", {"src", "f"}},
      {"syncDeleted", {"src", "f"}},
      {"unpackHistory", {"historyJson"}},
      {"canPush", {"history"}},
      {"syncBranches", {"src"}},
      {"isEquivalent", {"repo"}},
      {"addRepositoryObserver", {"observer"}},
      {"removeRepositoryObserver", {"observer"}},
      {"addRepositoryListener"},
      {"removeRepositoryListener"},
      {"notifyObservers"},
      {"toString", {"packetType"}},
      {"serializeAggregate", {"element"}}}},
    {"kiv.RepositoryObserver", {{"repositoryModified", {"src"}}}},
    {"kiv.Workspace",
     {{"canRedo"},
      {"canUndo"},
      {"canCommit"},
      {"canCheckout", {"name"}},
      {"updateContext"},
      {"push", {"mode"}},
      {"pull"},
      {"takeSnapshot"},
      {"undo"},
      {"redo"},
      {"setContext", {"commit", "mode"}},
      {"branch", {"name"}},
      {"checkout", {"branch"}},
      {"merge", {"srcBranch"}},
      {"commit", {"commit"}},
      {"getContext"},
      {"init", {"baseModel"}},
      {"update", {"delta"}},
      {"commitTransaction", {"fun"}},
      {"commitTransaction", {"fun"}},
      {"synchronousPush", {"mode"}},
      {"synchronousPull"}}},
    {"kiv.protocol.History",
     {{"parseHistory", {"historyJson", "model", "properties", "otherModel"}},
      {"pack"},
      {"resolveCommits"},
      {"unpack", {"historyJson", "model", "otherModel"}},
      {"unpackBranches", {"historyJson", "model"}},
      {"unpackNonBranches", {"historyJson", "model"}},
      {"isEquivalent", {"history"}},
      {"clear"}}},
};

const std::set<std::string> kAbstractOperations = {"kiv.Repository.load", "kiv.Repository.requestPull",
                                                   "kiv.Repository.setOnReceive",
                                                   "kiv.RepositoryObserver.repositoryModified"};

struct EnumRow {
  const char* name;  // qualified
  const char* package;
  std::vector<std::pair<std::string, int>> literals;
};

const EnumRow kEnums[] = {
    {"kiv.PushMode", "kiv", {{"TryPush", 0}, {"MergeFirst", 1}}},
    {"kiv.RepoType", "kiv", {{"Regular", 0}, {"Bare", 1}}},
    {"kiv.SetContextMode", "kiv", {{"ContextOnly", 0}, {"BranchUpdate", 1}}},
    {"kiv.protocol.PacketType",
     "kiv.protocol",
     {{"OK", 0},
      {"PullInfo", 1},
      {"RepoInfo", 2},
      {"Pull", 3},
      {"History", 4},
      {"Push", 5},
      {"CannotPush", 6},
      {"AddRemoteObserver", 7},
      {"RemoveRemoteObserver", 8},
      {"RepositoryModified", 9},
      {"Error", 10}}},
};

// The package's own opaque primitive types by name; true: it holds a shared pointer and
// is registered under its "kiv."-qualified name, false: under its bare name.
const std::pair<const char*, bool> kOwnPrimitives[] = {
    {"BranchElementMap", false},
    {"BranchFunPtr", false},
    {"BranchesFunPtr", false},
    {"CommitPred", false},
    {"CommitProducerPtr", true},
    {"CommitSet", false},
    {"FutureLocalRepository", false},
    {"FutureVoid", false},
    {"IMergeStrategy", false},
    {"IMergeStrategyPtr", true},
    {"IMergeTool", false},
    {"PacketTransportPtr", true},
    {"Path", false},
    {"RepositoryListenerPtr", true},
    {"StdFunction", false},
    {"SynchronizationChannelPtr", true},
};

std::string registeredName(const std::pair<const char*, bool>& primitive) {
  return primitive.second ? std::string("kiv.") + primitive.first : primitive.first;
}

// "kiv.Branch" -> "Branch"
std::string lastSegment(const std::string& qualified) { return qualified.substr(qualified.rfind('.') + 1); }

std::string nameOf(const meta::Type& type) { return type ? toUtf8(type.getQualifiedName()) : "<none>"; }
std::string nameOf(const meta::Property& p) { return p ? toUtf8(p.getQualifiedName()) : "<none>"; }

meta::MetaRegistry& registry() { return meta::MetaRegistry::getInstance(); }
meta::Package rootPackage() { return registry().getRootPackage(toUtf16(kRootUri)); }

void forEachPackage(const meta::Package& package, const std::function<void(const meta::Package&)>& visit) {
  if (!package) return;
  visit(package);
  for (const meta::Package& sub : package->getSubPackages()) forEachPackage(sub, visit);
}

// Every type of the package tree and every own primitive type the registry knows,
// each once, with the qualified name its UUID is made from.
std::vector<std::pair<meta::Type, std::string>> allOwnTypes() {
  std::vector<std::pair<meta::Type, std::string>> types;
  std::set<const void*> seen;
  auto add = [&](const meta::Type& type, std::string key) {
    if (type && seen.insert(type.getImpl()).second) types.emplace_back(type, std::move(key));
  };
  for (const auto& primitive : kOwnPrimitives) {
    add(registry().getType(toUtf16(registeredName(primitive))), std::string("kiv.") + primitive.first);
  }
  forEachPackage(rootPackage(), [&](const meta::Package& package) {
    for (const meta::Type& type : package->getTypes()) add(type, nameOf(type));
  });
  return types;
}

class MetamodelConformance : public ::testing::Test {
 protected:
  static void SetUpTestSuite() {
    kiv::MetaPackageKiv::getInstance().initialize();
    kiv::MetaPackageKiv::getInstance().initialize();  // a second call must change nothing
  }
};

TEST_F(MetamodelConformance, PackagesFormOneTreeAndHoldExactlyTheListedTypes) {
  const meta::Package root = rootPackage();
  ASSERT_TRUE(root);
  EXPECT_EQ(toUtf8(root.getName()), "");
  EXPECT_EQ(toUtf8(root->getUri()), kRootUri);
  ASSERT_EQ(root->getSubPackages().size(), 1u);
  const meta::Package kivPackage = root->getSubPackages()[0];
  EXPECT_EQ(toUtf8(kivPackage.getName()), "kiv");
  EXPECT_EQ(toUtf8(kivPackage->getUri()), "/qf0/kiv/19700101/kiv");
  EXPECT_EQ(toUtf8(kivPackage->getQualifiedName()), "kiv");
  EXPECT_TRUE(kivPackage->getParentPackage() == root);
  ASSERT_EQ(kivPackage->getImportedPackageURIs().size(), 1u);
  EXPECT_EQ(toUtf8(kivPackage->getImportedPackageURIs()[0]), "/qf0/meta/20160101");
  EXPECT_FALSE(registry().getRootPackage(u"/qf0/kiv/19700101/kiv"));
  ASSERT_EQ(kivPackage->getSubPackages().size(), 1u);
  const meta::Package protocol = kivPackage->getSubPackages()[0];
  EXPECT_EQ(toUtf8(protocol.getName()), "protocol");
  EXPECT_EQ(toUtf8(protocol->getUri()), "/qf0/kiv/19700101/kiv.protocol");
  EXPECT_EQ(toUtf8(protocol->getQualifiedName()), "kiv.protocol");
  EXPECT_TRUE(protocol->getParentPackage() == kivPackage);
  EXPECT_TRUE(protocol->getSubPackages().empty());

  // Classes, enumerations and the datatype must sit in their package; own primitive
  // types may sit in any package of the tree; nothing else may.
  std::map<std::string, std::string> expected;  // qualified type name -> package, "*" for any
  for (const ClassRow& row : kClasses) expected[row.name] = row.package;
  for (const EnumRow& row : kEnums) expected[row.name] = row.package;
  expected[kRepoInfo] = "kiv.protocol";
  for (const auto& primitive : kOwnPrimitives) expected[registeredName(primitive)] = "*";
  std::set<std::string> placed;
  forEachPackage(root, [&](const meta::Package& package) {
    for (const meta::Type& type : package->getTypes()) {
      const std::string name = nameOf(type), where = toUtf8(package->getQualifiedName());
      const auto it = expected.find(name);
      if (it == expected.end()) {
        ADD_FAILURE() << "unlisted type " << name << " in package '" << where << "'";
        continue;
      }
      EXPECT_TRUE(it->second == "*" || it->second == where) << name << " is in package '" << where << "'";
      EXPECT_TRUE(type->getOwningPackage() == package) << name;
      EXPECT_TRUE(placed.insert(name).second) << name << " appears twice in the package tree";
    }
  });
  for (const auto& [name, package] : expected) {
    if (package != "*") {
      EXPECT_TRUE(placed.count(name)) << name << " is missing from package " << package;
    }
  }
}

TEST_F(MetamodelConformance, ClassesHaveTheirSuperclassAndAbstractness) {
  for (const ClassRow& row : kClasses) {
    SCOPED_TRACE(row.name);
    const meta::Class cls = registry().getClass(toUtf16(row.name));
    ASSERT_TRUE(cls);
    EXPECT_EQ(toUtf8(cls.getName()), lastSegment(row.name));
    EXPECT_EQ(cls->isAbstract(), row.isAbstract);
    ASSERT_EQ(cls->getSuperclasses().size(), 1u);
    EXPECT_EQ(nameOf(cls->getSuperclasses()[0]), row.superclass);
    EXPECT_TRUE(cls->getSuperclasses()[0] == registry().getClass(toUtf16(row.superclass)))
        << "a registered class";
  }
}

// The property rows of the type `name`, after those of its superclasses when `inherited`.
std::vector<const PropertyRow*> propertyRowsOf(const std::string& name, bool inherited) {
  std::vector<const PropertyRow*> rows;
  for (const ClassRow& cls : kClasses) {
    if (cls.name == name && inherited) rows = propertyRowsOf(cls.superclass, true);
  }
  for (const PropertyRow& row : kProperties) {
    if (row.owner == name) rows.push_back(&row);
  }
  return rows;
}

void checkProperty(const meta::Property& p, const PropertyRow& row) {
  const std::string qualified = std::string(row.owner) + "." + row.name;
  SCOPED_TRACE(qualified);
  EXPECT_EQ(nameOf(p), qualified);
  EXPECT_EQ(p.getIndex(), row.index);
  EXPECT_EQ(static_cast<int>(p->getValueFlags()), static_cast<int>(row.kind));
  EXPECT_EQ(nameOf(p->getType()), row.type);
  EXPECT_EQ(p->isComposite(), (row.flags & Composite) != 0);
  EXPECT_EQ(p->isReadOnly(), (row.flags & ReadOnly) != 0);
  EXPECT_EQ(p->isSetOnce(), (row.flags & SetOnce) != 0);
  EXPECT_EQ(p->isTransient(), (row.flags & Transient) != 0);
  EXPECT_EQ(p->isPublicAccessor(), (row.flags & NotPublicGet) == 0);
  EXPECT_EQ(p->isPublicMutator(), (row.flags & NotPublicSet) == 0);
  EXPECT_EQ(p->isOrdered(), row.kind == Seq);
  EXPECT_EQ(p->isUnique(), row.kind != Seq);
  const bool many = row.kind == Seq || row.kind == Set || row.kind == Map;
  EXPECT_EQ(p->getLower(), row.kind == One ? 1 : 0);
  EXPECT_EQ(p->getUpper(), many ? -1 : 1);
  const auto& defaultText = p->getDefaultValueText();
  EXPECT_EQ(defaultText ? toUtf8(*defaultText) : "<none>", row.defaultText ? row.defaultText : "<none>");
  EXPECT_EQ(nameOf(p->getOpposite()), row.opposite ? row.opposite : "<none>");
  EXPECT_EQ(nameOf(p->getQualifiedBy()), row.key ? row.key : "<none>");
}

TEST_F(MetamodelConformance, PropertiesMatchTheTableInIndexOrder) {
  std::vector<std::string> owners;
  for (const ClassRow& row : kClasses) owners.push_back(row.name);
  owners.push_back(kRepoInfo);
  for (const std::string& owner : owners) {
    SCOPED_TRACE(owner);
    const auto type = qf::zero::elementCast<meta::StructuredType>(registry().getType(toUtf16(owner)));
    ASSERT_TRUE(type);
    const std::vector<const PropertyRow*> own = propertyRowsOf(owner, false);
    const std::vector<meta::Property>& actual = type->getOwnProperties();
    EXPECT_EQ(actual.size(), own.size()) << "own properties";
    for (std::size_t i = 0; i < std::min(actual.size(), own.size()); ++i) checkProperty(actual[i], *own[i]);

    // Index lookup covers inherited properties too and nothing past the last index.
    const meta::Class cls = qf::zero::elementCast<meta::Class>(type);
    if (!cls) continue;
    const std::vector<const PropertyRow*> all = propertyRowsOf(owner, true);
    EXPECT_EQ(cls->getAllProperties().size(), all.size()) << "all properties";
    for (const PropertyRow* row : all) {
      EXPECT_EQ(nameOf(cls->getPropertyByIndex(row->index)), std::string(row->owner) + "." + row->name);
    }
    const int last = all.empty() ? 0 : all.back()->index;
    EXPECT_FALSE(cls->getPropertyByIndex(last + 1)) << "a property past index " << last;
  }
}

TEST_F(MetamodelConformance, OperationsMatchTheTableInOrderWithTheirArguments) {
  std::size_t total = 0, invokable = 0;
  for (const ClassOperations& expected : kOperations) {
    SCOPED_TRACE(expected.owner);
    const meta::Class cls = registry().getClass(toUtf16(expected.owner));
    ASSERT_TRUE(cls);
    const std::vector<meta::Operation>& actual = cls->getOwnOperations();
    EXPECT_EQ(actual.size(), expected.operations.size()) << "own operations";
    std::map<std::string, std::vector<std::vector<std::string>>> signatures;  // argument types per name
    for (std::size_t i = 0; i < std::min(actual.size(), expected.operations.size()); ++i) {
      const meta::Operation& op = actual[i];
      const Op& row = expected.operations[i];
      const std::string qualified = std::string(expected.owner) + "." + row.name;
      SCOPED_TRACE(qualified + " #" + std::to_string(i));
      EXPECT_EQ(toUtf8(op.getName()), row.name);
      EXPECT_EQ(op->isAbstract(), kAbstractOperations.count(qualified) == 1);
      std::vector<std::string> names, types;
      for (const meta::Argument& argument : op->getArguments()) {
        names.push_back(toUtf8(argument.getName()));
        types.push_back(nameOf(argument->getType()));
        EXPECT_EQ(argument->isInput(), names.back() != "result") << names.back();
      }
      EXPECT_EQ(names, row.arguments);
      for (const auto& other : signatures[row.name]) {
        EXPECT_NE(types, other) << "an overload with the same argument types";
      }
      signatures[row.name].push_back(types);
      total += 1;
      invokable += op->getInvoker() != nullptr;
    }
  }
  EXPECT_EQ(total, 129u);
  EXPECT_EQ(invokable, 100u) << "operations with an invoker";
  const auto repoInfo = qf::zero::elementCast<meta::DataType>(registry().getType(toUtf16(kRepoInfo)));
  ASSERT_TRUE(repoInfo);
  EXPECT_TRUE(repoInfo->getOwnOperations().empty());
}

TEST_F(MetamodelConformance, EnumerationsHaveTheirLiteralsAndValuesInOrder) {
  for (const EnumRow& row : kEnums) {
    SCOPED_TRACE(row.name);
    const auto enumeration = qf::zero::elementCast<meta::Enum>(registry().getType(toUtf16(row.name)));
    ASSERT_TRUE(enumeration);
    EXPECT_EQ(toUtf8(enumeration.getName()), lastSegment(row.name));
    std::vector<std::pair<std::string, int>> literals;
    for (const meta::EnumLiteral& literal : enumeration->getLiterals()) {
      literals.emplace_back(toUtf8(literal.getName()), literal.getValue());
    }
    EXPECT_EQ(literals, row.literals);
  }
}

TEST_F(MetamodelConformance, PrimitiveTypesAreRegisteredUnderOneNameAndRepoInfoIsADataType) {
  for (const auto& primitive : kOwnPrimitives) {
    const std::string registered = registeredName(primitive);
    SCOPED_TRACE(registered);
    const meta::PrimitiveType type = registry().getPrimitiveType(toUtf16(registered));
    ASSERT_TRUE(type);
    EXPECT_EQ(toUtf8(type.getName()), primitive.first);
    EXPECT_EQ(toUtf8(type.getQualifiedName()), registered);
    // Pointer types hold shared pointers, checked and defaulted like any value;
    // the other package types are opaque.
    EXPECT_EQ(type->getTraits() != nullptr, primitive.second) << "value traits exactly for pointer types";
    const std::string otherName = primitive.second ? primitive.first : std::string("kiv.") + primitive.first;
    EXPECT_FALSE(registry().getType(toUtf16(otherName))) << "also registered as " << otherName;
  }
  const meta::Type repoInfo = registry().getType(toUtf16(kRepoInfo));
  ASSERT_TRUE(qf::zero::elementCast<meta::DataType>(repoInfo));
  EXPECT_FALSE(qf::zero::elementCast<meta::Class>(repoInfo));
  EXPECT_EQ(toUtf8(repoInfo.getName()), "RepoInfo");
}

TEST_F(MetamodelConformance, ItemUuidsAreFixedNameBasedAndDistinct) {
  // The fixed identities of a few items, as published; they never change.
  const std::pair<const char*, const char*> pinned[] = {
      {"/qf0/kiv/19700101", "574a9947-6309-31e3-86aa-d8c2884744dc"},
      {"/qf0/kiv/19700101/kiv.protocol", "f3b6701b-9fc5-3eb1-8cb7-7b9ffa8b0399"},
      {"kiv.Branch", "907299ca-4cea-3b3f-8d5c-200201e77a74"},
      {"kiv.protocol.History", "f6455af9-a5e6-3918-9d82-8083a968bdb1"},
      {"kiv.Branch.name", "28902009-f533-3e46-942f-e83b1486d572"},
      {"kiv.ObjectStorage.elementUUID", "a4f44cc2-ea55-3a84-b18c-b13722f6be1a"},
      {"kiv.PushMode.TryPush", "2e08754f-e46f-3028-b342-ad4df3ce66e7"},
      {"kiv.protocol.PacketType.Error", "c70bd69b-a347-3183-9821-843fb5a6f4d2"},
      {"kiv.Path", "21570ab4-7bfb-3fbd-af82-743439957f4a"},
      {"kiv.CommitProducerPtr", "debeb255-8afd-34f7-9d1c-5fae8ee6b12d"},
  };
  const Uuid ns = qf::zero::nameBasedUuid(Uuid{}, kRootUri);
  EXPECT_EQ(qf::zero::toText(ns), "d4fd33ee-f86a-3754-bd45-9b9634e1ed5c");

  std::map<std::string, Uuid> keyed;   // item key -> its UUID
  std::map<Uuid, std::string> owners;  // UUID -> the item that has it
  auto record = [&](const qf::zero::ModelElement& item, const std::string& label, bool hasKey) {
    const Uuid& id = item.getUuid();
    EXPECT_EQ(id.version(), boost::uuids::uuid::version_name_based_md5) << label;
    const auto [it, fresh] = owners.emplace(id, label);
    EXPECT_TRUE(fresh) << label << " shares its UUID with " << it->second;
    if (hasKey) keyed[label] = id;
  };
  forEachPackage(rootPackage(), [&](const meta::Package& p) { record(p, toUtf8(p->getUri()), true); });
  for (const auto& [type, key] : allOwnTypes()) {
    record(type, key, true);
    if (const auto enumeration = qf::zero::elementCast<meta::Enum>(type)) {
      for (const meta::EnumLiteral& literal : enumeration->getLiterals()) {
        record(literal, key + "." + toUtf8(literal.getName()), true);
      }
    }
    const auto structured = qf::zero::elementCast<meta::StructuredType>(type);
    if (!structured) continue;
    for (const meta::Property& property : structured->getOwnProperties())
      record(property, nameOf(property), true);
    for (const meta::Operation& op : structured->getOwnOperations()) {
      const auto label = key + "." + toUtf8(op.getName()) + "/" + std::to_string(op->getArguments().size());
      record(op, label, false);
      for (const meta::Argument& argument : op->getArguments()) {
        record(argument, label + ":" + toUtf8(argument.getName()), false);
      }
    }
  }
  std::size_t items = 3 + std::size(kClasses) + 1 + std::size(kOwnPrimitives) + std::size(kProperties);
  for (const EnumRow& row : kEnums) items += 1 + row.literals.size();
  for (const ClassOperations& cls : kOperations) {
    for (const Op& op : cls.operations) items += 1 + op.arguments.size();
  }
  EXPECT_EQ(owners.size(), items) << "items walked";
  for (const auto& [key, id] : keyed) {
    EXPECT_EQ(qf::zero::toText(id), qf::zero::toText(qf::zero::nameBasedUuid(ns, key))) << key;
  }
  for (const auto& [key, text] : pinned) {
    ASSERT_TRUE(keyed.count(key)) << key;
    EXPECT_EQ(qf::zero::toText(keyed[key]), text) << key;
  }
}

}  // namespace
