#include "qf/zero/core/change_report.h"

#include "qf/zero/core/internal/storage.h"
#include "qf/zero/core/owned_collection.h"

namespace qf::zero {

ReportData::ReportData(Model model, std::vector<Entry> entries, boost::optional<Value> result)
    : model_(std::move(model)), entries_(std::move(entries)), result_(std::move(result)) {
  for (std::size_t i = 0; i < entries_.size(); ++i) index_.emplace(entries_[i].element.getImpl(), i);
}

const ReportData::Entry* ReportData::find(const ModelElement& element) const {
  auto it = index_.find(element.getImpl());
  return it == index_.end() ? nullptr : &entries_[it->second];
}

bool ReportData::isAdded(const ModelElement& element) const {
  const Entry* entry = find(element);
  return entry != nullptr && entry->kind == Kind::Added;
}

bool ReportData::isModified(const ModelElement& element) const {
  const Entry* entry = find(element);
  return entry != nullptr && entry->kind == Kind::Modified;
}

bool ReportData::isDestroyed(const ModelElement& element) const {
  const Entry* entry = find(element);
  return entry != nullptr && entry->kind == Kind::Destroyed;
}

bool ReportData::isChanged(const ModelElement& element, const meta::Property& property) const {
  const Entry* entry = find(element);
  if (entry == nullptr) return false;
  if (entry->kind == Kind::Added) return true;
  return entry->storage && entry->storage->isChanged(property.getIndex());
}

Value ReportData::getOldValue(const ModelElement& element, const meta::Property& property) const {
  const Entry* entry = find(element);
  if (entry != nullptr && entry->kind == Kind::Added) return Value();
  if (entry != nullptr && entry->storage && entry->storage->isChanged(property.getIndex())) {
    return entry->storage->getOldValue(property);
  }
  if (property->isMany()) {
    return Value::list(element->basicGetCollection(property)->snapshot(), property);
  }
  return element->basicGetValue(property);
}

}  // namespace qf::zero
