// Queries over the elements of one model.
//
// A query ranges over the instances of the classes attached to it and keeps those its
// condition accepts. Element classes take part through their `Constrainables`
// attachment, so a query over books can be written without naming the model's index:
//
//   query::PredicateQuery longBooks(model, [&](const ModelElement& e) { return pages(e) > 500; });
//   Book::Constrainables books(longBooks);
//   for (const ModelElement& book : longBooks.evaluate()) ...
#pragma once

#include "qf/zero/core/meta/structured_type.h"
#include "qf/zero/core/model.h"
#include "qf/zero/core/model_element.h"

#include <functional>
#include <vector>

namespace qf::zero {
namespace query {

enum class SearchClassMatchMode { ExactClass, IncludeSubclasses };

class InstanceAttachment;

// Selects from one model the live instances of the classes attached to it that accepts() lets
// through. The attachments must not outlive the query.
class AbstractQuery {
 public:
  explicit AbstractQuery(Model model);
  AbstractQuery(const AbstractQuery&) = delete;
  AbstractQuery& operator=(const AbstractQuery&) = delete;
  virtual ~AbstractQuery();

  const Model& getModel() const noexcept { return model_; }

  // Whether `candidate` satisfies the query's condition; the default accepts all.
  virtual bool accepts(const ModelElement& candidate) const;

  // The accepted live instances of every attached class, each once: attachments in
  // the order they were made, each in creation order. Empty without attachments.
  std::vector<ModelElement> evaluate() const;

 private:
  friend class InstanceAttachment;
  Model model_;
  std::vector<const InstanceAttachment*> attachments_;
};

// A query whose condition is a callable.
class PredicateQuery final : public AbstractQuery {
 public:
  PredicateQuery(Model model, std::function<bool(const ModelElement&)> condition);
  bool accepts(const ModelElement& candidate) const override;

 private:
  std::function<bool(const ModelElement&)> condition_;
};

// Binds a class to a query for as long as the attachment lives. REQUIRES: the query
// outlives the attachment.
class InstanceAttachment {
 public:
  InstanceAttachment(AbstractQuery& query, meta::Class metaClass, SearchClassMatchMode mode);
  InstanceAttachment(const InstanceAttachment&) = delete;
  InstanceAttachment& operator=(const InstanceAttachment&) = delete;
  virtual ~InstanceAttachment();

  const meta::Class& getMetaClass() const noexcept { return metaClass_; }
  SearchClassMatchMode getMatchMode() const noexcept { return mode_; }

  // The live instances of this attachment's class that the query accepts.
  std::vector<ModelElement> getInstances() const;

 private:
  AbstractQuery& query_;
  meta::Class metaClass_;
  SearchClassMatchMode mode_;
};

}  // namespace query

// The attachment of the root class; every element class's `Constrainables` derives
// from its superclass's, naming its own class.
class ModelElement::Constrainables : public query::InstanceAttachment {
 public:
  explicit Constrainables(query::AbstractQuery& query,
                          query::SearchClassMatchMode mode = query::SearchClassMatchMode::IncludeSubclasses);
  Constrainables(query::AbstractQuery& query, meta::Class metaClass, query::SearchClassMatchMode mode);
};

}  // namespace qf::zero
