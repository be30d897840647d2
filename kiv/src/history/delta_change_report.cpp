// Delta::toChangeReport: a delta as the framework's JSON change report.
#include "history/history_support.h"
#include "kiv/metamodel/delta_impl.h"
#include "kiv/metamodel/object_storage_impl.h"
#include "qf/zero/core/meta/meta_registry.h"
#include "qf/zero/core/meta/property.h"
#include "qf/zero/core/text.h"
#include "qf/zero/io/json_change_report_synchronizer.h"
#include "qf/zero/io/json_constants.h"

#include <nlohmann/json.hpp>

#include <set>
#include <string>

namespace kiv {

namespace {

using qf::zero::JsonValue;
using qf::zero::io::JSONConstants;
using DestroyedIds = std::set<std::string>;

bool survives(const JsonValue& reference, const DestroyedIds& destroyed) {
  return reference.is_string() && destroyed.count(reference.get<std::string>()) == 0;
}

// A stored "before" may be older than the deletion (a composed delta keeps each
// element's oldest state), so it can still list children that were moved elsewhere
// before their container went. Those children are not destroyed with it: their ids
// are dropped from its containment properties. Everything else the entry holds stays.
void forgetSurvivingChildren(JsonValue& content, const qf::zero::meta::Class& metaClass,
                             const DestroyedIds& destroyed) {
  if (!content.is_object()) return;
  for (const qf::zero::meta::Property& property : metaClass->getAllProperties()) {
    if (!property->isContainment()) continue;
    const auto member = content.find(qf::zero::toUtf8(property.getName()));
    if (member == content.end()) continue;
    if (member->is_array()) {
      JsonValue kept = JsonValue::array();
      for (JsonValue& child : *member) {
        if (!survives(child, destroyed)) kept.push_back(std::move(child));
      }
      *member = std::move(kept);
    } else if (survives(*member, destroyed)) {
      *member = nullptr;
    }
  }
}

// Destroyed entries keep their type, identity and own data; an entry whose type names no
// registered class is passed on unchanged.
JsonValue destroyedEntry(const JsonValue& stored, const DestroyedIds& destroyed) {
  JsonValue entry = stored;
  if (!entry.is_object()) return entry;
  const auto type = entry.find(JSONConstants::TYPE_ATTR);
  if (type == entry.end() || !type->is_string()) return entry;
  const qf::zero::meta::Class metaClass =
      qf::zero::meta::MetaRegistry::getInstance().getClass(qf::zero::toUtf16(type->get<std::string>()));
  if (!metaClass || !metaClass.isLive()) return entry;
  const auto content = entry.find(JSONConstants::CONTENT_ATTR);
  if (content == entry.end()) {
    entry[JSONConstants::CONTENT_ATTR] = JsonValue::object();
  } else {
    forgetSurvivingChildren(*content, metaClass, destroyed);
  }
  return entry;
}

}  // namespace

JsonValue Delta::Impl::toChangeReport() const {
  JsonValue added = JsonValue::array();
  JsonValue modified = JsonValue::array();
  history::forEachPresent(current_, [&](const qf::zero::Uuid& uuid, const ObjectStorage& storage) {
    (history::presentEntry(previous_, uuid) ? modified : added).push_back(storage.getContent());
  });

  DestroyedIds destroyedIds;
  std::vector<ObjectStorage> deleted;
  history::forEachPresent(previous_, [&](const qf::zero::Uuid& uuid, const ObjectStorage& storage) {
    if (history::presentEntry(current_, uuid)) return;
    destroyedIds.insert(qf::zero::toText(uuid));
    deleted.push_back(storage);
  });
  JsonValue destroyed = JsonValue::array();
  for (const ObjectStorage& storage : deleted)
    destroyed.push_back(destroyedEntry(storage.getContent(), destroyedIds));

  return qf::zero::io::JSONChangeReportSynchronizer::makeChangeReport(std::move(added), std::move(modified),
                                                                      std::move(destroyed));
}

}  // namespace kiv
