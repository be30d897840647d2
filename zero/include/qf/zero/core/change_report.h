// Change reports: what one committed (or cancelled) transaction did to a model.
//
// Elements are listed in the order they first changed. An element created and
// destroyed in the same transaction appears nowhere; a property changed and changed
// back is not a change, and an element whose every change came back is not modified.
#pragma once

#include "qf/zero/core/internal/element_impl.h"
#include "qf/zero/core/model.h"
#include "qf/zero/core/model_element.h"
#include "qf/zero/core/value.h"

#include <boost/optional.hpp>

#include <memory>
#include <unordered_map>
#include <vector>

namespace qf::zero {

// What one transaction did to its model: the elements added, modified and destroyed, in the
// order they first changed, and the values they had before. Not changed once made.
class ReportData {
 public:
  enum class Kind { Added, Modified, Destroyed };
  // One changed element: how it changed, and its old values unless it was added.
  struct Entry {
    ModelElement element;
    Kind kind;
    std::shared_ptr<ModelElement::Impl::Storage> storage;  // null for added elements
  };

  ReportData(Model model, std::vector<Entry> entries, boost::optional<Value> result);
  virtual ~ReportData() = default;

  const Model& getModel() const noexcept { return model_; }
  const std::vector<Entry>& getEntries() const noexcept { return entries_; }
  bool isEmpty() const noexcept { return entries_.empty(); }
  const boost::optional<Value>& getResult() const noexcept { return result_; }

  bool isAdded(const ModelElement& element) const;
  bool isModified(const ModelElement& element) const;
  bool isDestroyed(const ModelElement& element) const;
  // True when the transaction changed `property` of `element` (for an added element:
  // every property; for a destroyed one: every property it had recorded).
  bool isChanged(const ModelElement& element, const meta::Property& property) const;
  // The value `property` had before the transaction: the recorded old value when it
  // changed, the current value otherwise, empty for an added element.
  Value getOldValue(const ModelElement& element, const meta::Property& property) const;

 private:
  const Entry* find(const ModelElement& element) const;

  Model model_;
  std::vector<Entry> entries_;
  std::unordered_map<const ModelElement::Impl*, std::size_t> index_;
  boost::optional<Value> result_;
};

// The report a shallow listener receives: the elements of the model that were added,
// modified and destroyed, typed as E.
template <class E>
class ShallowChangeReport : public ReportData {
 public:
  ShallowChangeReport(Model model, std::vector<Entry> entries, boost::optional<Value> result)
      : ReportData(std::move(model), std::move(entries), std::move(result)) {
    for (const Entry& entry : getEntries()) {
      E element = elementCast<E>(entry.element);
      if (!element) continue;
      switch (entry.kind) {
        case Kind::Added:
          added_.push_back(element);
          break;
        case Kind::Modified:
          modified_.push_back(element);
          break;
        case Kind::Destroyed:
          destroyed_.push_back(element);
          break;
      }
    }
  }
  const std::vector<E>& getAdded() const noexcept { return added_; }
  const std::vector<E>& getModified() const noexcept { return modified_; }
  const std::vector<E>& getDestroyed() const noexcept { return destroyed_; }

 private:
  std::vector<E> added_;
  std::vector<E> modified_;
  std::vector<E> destroyed_;
};

// The report a deep listener receives: the shallow report plus every live container
// (transitively) of a changed element that did not change itself, nearest first.
template <class E>
class DeepChangeReport : public ShallowChangeReport<E> {
 public:
  DeepChangeReport(Model model, std::vector<ReportData::Entry> entries, boost::optional<Value> result)
      : ShallowChangeReport<E>(std::move(model), std::move(entries), std::move(result)) {
    std::unordered_map<const ModelElement::Impl*, bool> seen;
    for (const ReportData::Entry& entry : this->getEntries()) seen.emplace(entry.element.getImpl(), true);
    for (const ReportData::Entry& entry : this->getEntries()) {
      for (ModelElement::Impl* up = entry.element->containerImpl(); up != nullptr; up = up->containerImpl()) {
        if (!seen.emplace(up, true).second) break;
        if (E typed = elementCast<E>(ModelElement(up))) affected_.push_back(typed);
      }
    }
  }
  const std::vector<E>& getAffectedContainers() const noexcept { return affected_; }

 private:
  std::vector<E> affected_;
};

}  // namespace qf::zero
