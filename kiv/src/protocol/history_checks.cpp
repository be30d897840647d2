#include "protocol/history_checks.h"

#include "kiv/messages/messages.h"
#include "kiv/metamodel/branch_impl.h"
#include "kiv/metamodel/commit_impl.h"
#include "kiv/metamodel/delta_impl.h"
#include "kiv/metamodel/object_storage_impl.h"
#include "qf/zero/core/report_exception.h"
#include "qf/zero/io/json_constants.h"

#include <nlohmann/json.hpp>

#include <set>
#include <string>
#include <unordered_map>
#include <vector>

namespace kiv::protocol {

namespace {

bool isPresent(const qf::zero::ModelElement& element) { return element && element.isLive(); }

template <class Set>
void checkNamesOnce(const Set& branches, const char* set) {
  std::set<std::u16string> names;
  for (const Branch& branch : branches.container()) {
    if (isPresent(branch) && !names.insert(branch->getName()).second) {
      qf::zero::reportException(messages::MalformedHistory(std::string("two branches of the ") + set +
                                                           " set are named " +
                                                           qf::zero::toUtf8(branch->getName())));
    }
  }
}

// Depth-first over the carried commits, without recursion: a peer chooses the depth.
void checkAcyclic(const History& history) {
  enum class Mark { Open, Done };
  std::unordered_map<Commit, Mark> marks;
  for (const Commit& start : history.getCommits().container()) {
    if (!isPresent(start) || marks.count(start)) continue;
    std::vector<std::pair<Commit, std::size_t>> stack{{start, 0}};
    marks[start] = Mark::Open;
    while (!stack.empty()) {
      auto& [commit, next] = stack.back();
      const auto& parents = commit->getParents().container();
      if (next == parents.size()) {
        marks[commit] = Mark::Done;
        stack.pop_back();
        continue;
      }
      const Commit parent = parents[next++];
      if (!isPresent(parent) || !history.getCommits().container().count(parent)) continue;
      const auto mark = marks.find(parent);
      if (mark == marks.end()) {
        marks[parent] = Mark::Open;
        stack.emplace_back(parent, 0);
      } else if (mark->second == Mark::Open) {
        qf::zero::reportException(messages::MalformedHistory("commit " + qf::zero::toText(parent.getUuid()) +
                                                             " is its own ancestor"));
      }
    }
  }
}

void checkDeltaKeys(const History& history) {
  for (const Delta& delta : history.getDeltas().container()) {
    if (!isPresent(delta)) continue;
    for (const auto* side : {&delta->getPrevious().container(), &delta->getCurrent().container()}) {
      for (const auto& [uuid, storage] : *side) {
        if (isPresent(storage) && storage->getElementUUID() != uuid) {
          qf::zero::reportException(messages::MalformedHistory("delta " + qf::zero::toText(delta.getUuid()) +
                                                               " files a storage under another element"));
        }
      }
    }
  }
}

// What a storage entry's "content" must hold: the entry of the element it names, as the
// serializer writes it.
void checkStoredEntry(const qf::zero::JsonValue& storageEntry) {
  using qf::zero::io::JSONConstants;
  const auto id = storageEntry.find(JSONConstants::ID_ATTR);
  const auto properties = storageEntry.find(JSONConstants::CONTENT_ATTR);
  // Entries the parser refuses anyway (no id, no content, wrong JSON types) are left to it.
  if (id == storageEntry.end() || !id->is_string() || properties == storageEntry.end() ||
      !properties->is_object()) {
    return;
  }
  const MetaPackageKiv& kiv = MetaPackageKiv::getInstance();
  static const std::string elementUuidName = qf::zero::toUtf8(kiv.getObjectStorage_elementUUID().getName());
  static const std::string contentName = qf::zero::toUtf8(kiv.getObjectStorage_content().getName());
  static const std::string nilUuidText = qf::zero::toText(qf::zero::Uuid());
  const auto elementUuid = properties->find(elementUuidName);
  const auto stored = properties->find(contentName);
  const bool namesElement = elementUuid != properties->end() && elementUuid->is_string() &&
                            !elementUuid->get_ref<const std::string&>().empty() &&
                            elementUuid->get_ref<const std::string&>() != nilUuidText;
  const auto refuse = [&](const std::string& what) {
    qf::zero::reportException(messages::MalformedHistory("storage " + id->get<std::string>() + " " + what));
  };
  if (stored == properties->end() || stored->is_null()) {
    if (namesElement) refuse("names an element but holds no entry");
    return;
  }
  if (!namesElement) refuse("holds content but names no element");
  if (!stored->is_object()) refuse("holds no element entry");
  const auto type = stored->find(JSONConstants::TYPE_ATTR);
  if (type == stored->end() || !type->is_string() || type->get_ref<const std::string&>().empty()) {
    refuse("holds an entry without a type");
  }
  const auto storedId = stored->find(JSONConstants::ID_ATTR);
  if (storedId == stored->end() || *storedId != *elementUuid) refuse("holds an entry of another element");
  const auto storedContent = stored->find(JSONConstants::CONTENT_ATTR);
  if (storedContent == stored->end() || !storedContent->is_object()) refuse("holds an entry without content");
  if (stored->size() != 3) refuse("holds an entry with members of no entry");
}

}  // namespace

void checkReceivedHistory(const History& history) {
  checkNamesOnce(history.getPrevious(), "previous");
  checkNamesOnce(history.getCurrent(), "current");
  checkAcyclic(history);
  checkDeltaKeys(history);
}

// A storage holds one element's entry: {"type": <class name>, "id": <the element's UUID>,
// "content": {<property>: <value>, ...}}; an empty storage holds null. The user metamodel may
// be unknown here (a bare repository serves any model), so the shape is checked, not the
// class: a wrong entry would otherwise surface only when a clone replays it into a user
// model, long after the history was taken in. Checked on the document, before any element
// is made, so that no stored text is parsed twice.
void checkStorageEntries(const qf::zero::JsonValue& document) {
  using qf::zero::io::JSONConstants;
  if (!document.is_object()) return;
  static const std::string storageClass = qf::zero::toUtf8(ObjectStorage::metaClass().getQualifiedName());
  const auto entries = document.find(JSONConstants::ENTRIES_ATTR);
  if (entries == document.end() || !entries->is_array()) return;
  for (const qf::zero::JsonValue& entry : *entries) {
    if (!entry.is_object()) continue;
    const auto type = entry.find(JSONConstants::TYPE_ATTR);
    if (type != entry.end() && type->is_string() && type->get_ref<const std::string&>() == storageClass) {
      checkStoredEntry(entry);
    }
  }
}

}  // namespace kiv::protocol
