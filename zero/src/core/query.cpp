#include "qf/zero/core/query.h"

#include "qf/zero/core/model_impl.h"

#include <algorithm>
#include <unordered_set>

namespace qf::zero::query {

AbstractQuery::AbstractQuery(Model model) : model_(std::move(model)) {}

AbstractQuery::~AbstractQuery() = default;

bool AbstractQuery::accepts(const ModelElement&) const { return true; }

std::vector<ModelElement> AbstractQuery::evaluate() const {
  if (attachments_.size() == 1) return attachments_.front()->getInstances();
  std::vector<ModelElement> result;
  std::unordered_set<ModelElement> seen;
  for (const InstanceAttachment* attachment : attachments_) {
    for (ModelElement& element : attachment->getInstances()) {
      if (seen.insert(element).second) result.push_back(std::move(element));
    }
  }
  return result;
}

PredicateQuery::PredicateQuery(Model model, std::function<bool(const ModelElement&)> condition)
    : AbstractQuery(std::move(model)), condition_(std::move(condition)) {}

bool PredicateQuery::accepts(const ModelElement& candidate) const {
  return !condition_ || condition_(candidate);
}

InstanceAttachment::InstanceAttachment(AbstractQuery& query, meta::Class metaClass, SearchClassMatchMode mode)
    : query_(query), metaClass_(std::move(metaClass)), mode_(mode) {
  query_.attachments_.push_back(this);
}

InstanceAttachment::~InstanceAttachment() { std::erase(query_.attachments_, this); }

std::vector<ModelElement> InstanceAttachment::getInstances() const {
  std::vector<ModelElement> instances = query_.getModel()->getInstances(metaClass_, mode_);
  std::erase_if(instances, [this](const ModelElement& e) { return !query_.accepts(e); });
  return instances;
}

}  // namespace qf::zero::query

namespace qf::zero {

ModelElement::Constrainables::Constrainables(query::AbstractQuery& query, query::SearchClassMatchMode mode)
    : InstanceAttachment(query, ModelElement::metaClass(), mode) {}

ModelElement::Constrainables::Constrainables(query::AbstractQuery& query, meta::Class metaClass,
                                             query::SearchClassMatchMode mode)
    : InstanceAttachment(query, std::move(metaClass), mode) {}

}  // namespace qf::zero
