#include "kiv/messages/messages.h"
#include "kiv/metamodel/branch_impl.h"
#include "kiv/metamodel/commit_impl.h"
#include "kiv/metamodel/delta_impl.h"
#include "kiv/metamodel/protocol/history_impl.h"
#include "kiv/protocol/aggregate_customizer.h"
#include "kiv/protocol/history_text.h"
#include "kiv/protocol/terminator_model_builder.h"
#include "protocol/history_checks.h"
#include "qf/zero/core/internal/flat_table.h"
#include "qf/zero/core/messages.h"
#include "qf/zero/core/model_impl.h"
#include "qf/zero/core/report_exception.h"
#include "qf/zero/core/transaction.h"
#include "qf/zero/io/json_parser.h"
#include "qf/zero/io/json_serializer.h"
#include "qf/zero/io/parse_customizer.h"

#include <nlohmann/json.hpp>

#include <algorithm>
#include <map>
#include <unordered_set>

namespace kiv::protocol {

namespace {

using qf::zero::ModelElement;

bool isPresent(const ModelElement& element) { return element && element.isLive(); }

qf::zero::Transaction beginOn(const ModelElement::Impl& element) {
  if (element.isProxy()) qf::zero::reportException(qf0::messages::CannotModifyProxy());
  if (!element.isLive()) qf::zero::reportException(qf0::messages::CannotModifyDestroyedElement());
  return element.getModelImpl()->beginTransaction();
}

// What a received history's entries are read as. The History entry reads only the named
// sets; the other entries are read only when a named set holds their class; an entry
// that the target model already holds is not read again: recorded history is immutable,
// and references to it resolve to the element that is there.
class HistoryParseCustomizer : public qf::zero::io::ParseCustomizer {
 public:
  HistoryParseCustomizer(qf::zero::Model model, const std::vector<std::u16string>& properties)
      : model_(std::move(model)) {
    for (const qf::zero::meta::Property& property : History::metaClass()->getAllProperties()) {
      if (std::find(properties.begin(), properties.end(), property.getName()) != properties.end())
        properties_.push_back(property);
    }
  }

  bool shallInstantiate(const qf::zero::meta::Class& type, const qf::zero::io::ElementId& id) override {
    const MetaPackageKiv& kiv = MetaPackageKiv::getInstance();
    if (type == History::metaClass()) {
      if (++histories_ > 1)
        qf::zero::reportException(messages::MalformedHistory("more than one history entry"));
      return true;
    }
    bool wanted = false;
    if (type == Branch::metaClass()) {
      wanted = reads(kiv.getHistory_previous()) || reads(kiv.getHistory_current());
    } else if (type == Commit::metaClass()) {
      wanted = reads(kiv.getHistory_commits());
    } else if (type == Delta::metaClass()) {
      wanted = reads(kiv.getHistory_deltas());
    } else if (type == ObjectStorage::metaClass()) {
      wanted = reads(kiv.getHistory_objectStorages());
    } else {
      qf::zero::reportException(
          messages::MalformedHistory("an entry of class " + qf::zero::toUtf8(type.getQualifiedName())));
    }
    if (!wanted || !id.uuid || id.uuid->is_nil()) return false;
    const ModelElement held = model_->findElement(*id.uuid, qf::zero::FindElementBehavior::IncludeProxies);
    if (!held) return true;
    if (held.isProxy() || !held.getMetaClass()->isSubclassOf(type)) {
      qf::zero::reportException(qf0::messages::DuplicateElementId(qf::zero::toText(*id.uuid)));
    }
    return false;
  }

  bool shallReadProperty(const ModelElement& element, const qf::zero::meta::Property& property) override {
    if (element.getMetaClass() == History::metaClass()) return reads(property);
    // Which repository a branch belongs to is the receiver's business.
    return property != MetaPackageKiv::getInstance().getBranch_repository();
  }

 private:
  bool reads(const qf::zero::meta::Property& property) const {
    return std::find(properties_.begin(), properties_.end(), property) != properties_.end();
  }

  qf::zero::Model model_;
  std::vector<qf::zero::meta::Property> properties_;  // the History's properties read
  int histories_ = 0;
};

// Whether a set of the history holds `wanted` and nothing else.
template <class Collection, class Element>
bool holdsExactly(const Collection& collection, const std::unordered_set<Element>& wanted) {
  if (collection.size() != wanted.size()) return false;
  const auto& held = collection.container();
  return std::all_of(wanted.begin(), wanted.end(),
                     [&](const Element& element) { return held.count(element) != 0; });
}

template <class Element>
std::vector<Element> sortedByUuid(std::vector<Element> elements) {
  std::sort(elements.begin(), elements.end(),
            [](const Element& a, const Element& b) { return a.getUuid() < b.getUuid(); });
  return elements;
}

// The branches of a set as a map by name, as branch maps are compared.
template <class Set>
std::map<std::u16string, Branch> byName(const Set& branches) {
  std::map<std::u16string, Branch> result;
  for (const Branch& branch : branches.container()) {
    if (isPresent(branch)) result.emplace(branch->getName(), branch);
  }
  return result;
}

}  // namespace

// The commits between the two branch states. A branch state is its tip and its redo
// stack: the receiver takes both over, so the commits of the redo stack travel too.
void History::Impl::resolveCommits() {
  std::unordered_set<Commit> before;
  std::unordered_set<Commit> after;
  for (const Branch& branch : previous_.container()) {
    if (isPresent(branch) && isPresent(branch->getTip())) before.insert(branch->getTip());
  }
  for (const Branch& branch : current_.container()) {
    if (!isPresent(branch)) continue;
    if (isPresent(branch->getTip())) after.insert(branch->getTip());
    for (const Commit& undone : branch->getRedoStack().container()) {
      if (isPresent(undone)) after.insert(undone);
    }
  }
  std::unordered_set<Commit> between;
  Commit::Impl::selectInRange(before, after, between);
  if (holdsExactly(commits_, between)) return;
  qf::zero::Transaction transaction = beginOn(*this);
  getCommitsMutable().clear();
  for (const Commit& commit : sortedByUuid(std::vector<Commit>(between.begin(), between.end()))) {
    getCommitsMutable().add(commit);
  }
  transaction.commit();
}

namespace {

// Resolves the commits, then fills the delta and storage sets: each delta and storage the
// commits name, once.
void gatherForPacking(History::Impl& history) {
  history.resolveCommits();
  std::vector<Delta> deltaOrder;
  std::vector<ObjectStorage> storageOrder;
  std::unordered_set<Delta> deltas;
  std::unordered_set<ObjectStorage> storages;
  for (const Commit& commit : history.getCommits().container()) {
    const Delta delta = isPresent(commit) ? commit->getDelta() : Delta();
    if (!isPresent(delta) || !deltas.insert(delta).second) continue;
    deltaOrder.push_back(delta);
    for (const auto* side : {&delta->getPrevious().container(), &delta->getCurrent().container()}) {
      for (const auto& [uuid, storage] : *side) {
        if (isPresent(storage) && storages.insert(storage).second) storageOrder.push_back(storage);
      }
    }
  }
  // Packing the same history again changes nothing.
  if (holdsExactly(history.getDeltas(), deltas) && holdsExactly(history.getObjectStorages(), storages))
    return;
  qf::zero::Transaction transaction = beginOn(history);
  history.getObjectStoragesMutable().clear();
  history.getDeltasMutable().clear();
  for (const Delta& delta : deltaOrder) history.getDeltasMutable().add(delta);
  for (const ObjectStorage& storage : storageOrder) history.getObjectStoragesMutable().add(storage);
  transaction.commit();
}

void writePacked(History::Impl& history, const qf::zero::io::SerializationOutput& output) {
  gatherForPacking(history);
  qf::zero::io::JSONSerializer serializer(std::make_unique<qf::zero::io::JSONModelTraverser>(),
                                          std::make_unique<AggregateCustomizer>());
  serializer.serialize(ModelElement(&history), output);
}

}  // namespace

qf::zero::JsonValue History::Impl::pack() {
  qf::zero::JsonValue document;
  writePacked(*this, qf::zero::io::SerializationOutput::forIntermediateFormat(&document));
  return document;
}

std::string packAsText(const History& history) {
  if (!history) qf::zero::reportException(qf0::messages::ElementRequired(u"kiv.protocol.packAsText"));
  std::string text;
  writePacked(*history.getImpl(), qf::zero::io::SerializationOutput::forText(&text));
  return text;
}

void History::Impl::clear() {
  qf::zero::Transaction transaction = beginOn(*this);
  getObjectStoragesMutable().clear();
  getDeltasMutable().clear();
  getCommitsMutable().clear();
  getCurrentMutable().clear();
  getPreviousMutable().clear();
  transaction.commit();
}

bool History::Impl::isEquivalent(const History& other) const {
  if (!isPresent(other)) return false;
  const auto identities = [](const DeltasCollection& deltas) {
    std::unordered_set<qf::zero::Uuid, qf::zero::internal::KeyedUuidHash> result;
    for (const ModelElement& delta : deltas.getAllValuesAndProxies()) {
      result.insert(delta.isProxy() ? delta->getProxyId().elementId : delta.getUuid());
    }
    return result;
  };
  if (identities(deltas_) != identities(other->getDeltas())) return false;
  return Branch::Impl::areBranchMapsEquivalent(byName(previous_), byName(other->getPrevious())) &&
         Branch::Impl::areBranchMapsEquivalent(byName(current_), byName(other->getCurrent()));
}

History History::Impl::parseHistory(const qf::zero::JsonValue& historyJson, const qf::zero::Model& model,
                                    const std::vector<std::u16string>& properties,
                                    const qf::zero::Model& otherModel) {
  if (!model) qf::zero::reportException(qf0::messages::CannotCreateWithoutModel());
  qf::zero::io::JSONParser parser(std::make_unique<HistoryParseCustomizer>(model, properties),
                                  std::make_unique<TerminatorModelBuilder>(otherModel));
  checkStorageEntries(historyJson);
  qf::zero::Transaction transaction = model->beginTransaction();
  History history;
  for (const qf::zero::io::ParseItem& item : parser.parseVerbatim(historyJson, model)) {
    const ModelElement element = item.getValue().getElement();
    if (element && element.getMetaClass() == History::metaClass()) {
      history = qf::zero::elementCast<History>(element);
      break;
    }
  }
  if (!history) qf::zero::reportException(messages::MalformedHistory("no history entry"));
  checkReceivedHistory(history);
  transaction.commit();
  return history;
}

History History::Impl::unpack(const qf::zero::JsonValue& historyJson, const qf::zero::Model& model,
                              const qf::zero::Model& otherModel) {
  return parseHistory(historyJson, model, {u"previous", u"current", u"commits", u"deltas", u"objectStorages"},
                      otherModel);
}

History History::Impl::unpackBranches(const qf::zero::JsonValue& historyJson, const qf::zero::Model& model) {
  return parseHistory(historyJson, model, {u"previous", u"current"}, qf::zero::Model());
}

// References must resolve in the target model itself: a commit, delta or storage that is
// neither carried nor already there makes the history dangle.
History History::Impl::unpackNonBranches(const qf::zero::JsonValue& historyJson,
                                         const qf::zero::Model& model) {
  if (!model) qf::zero::reportException(qf0::messages::CannotCreateWithoutModel());
  qf::zero::Transaction transaction = model->beginTransaction();
  History history = parseHistory(historyJson, model, {u"commits", u"deltas", u"objectStorages"}, model);
  transaction.commit();
  return history;
}

}  // namespace kiv::protocol
