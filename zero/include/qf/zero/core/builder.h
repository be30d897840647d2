// Builders create elements with their initial values in one step.
//
//   auto builder = bookClass->instantiateBuilder(model);
//   builder->setOrAdd(title, Value::of(std::u16string(u"Dune")));
//   ModelElement book = builder->create();
//
// An Orchestrator creates several elements that refer to one another: every element
// is made first, values are set second, all in one transaction.
#pragma once

#include "qf/zero/core/internal/element_impl.h"
#include "qf/zero/core/meta/structured_type.h"
#include "qf/zero/core/model.h"
#include "qf/zero/core/value.h"

#include <memory>
#include <unordered_map>
#include <vector>

namespace qf::zero {

// Collects the initial values of one element, then creates the element with all of them in
// one transaction: a value the model refuses leaves nothing behind. Generated classes derive
// typed builders from it.
class ModelElement::Builder {
 public:
  class Orchestrator;

  Builder(Model model, int count) : model_(std::move(model)) {
    entries_.reserve(static_cast<std::size_t>(count));
  }
  explicit Builder(int count) : Builder(Model(), count) {}
  virtual ~Builder() = default;
  Builder(const Builder&) = delete;
  Builder& operator=(const Builder&) = delete;

  void setModel(Model model) { model_ = std::move(model); }
  const Model& getModel() const noexcept { return model_; }
  void setUuid(const Uuid& id) { uuid_ = id; }

  // Sets a single-valued property or adds to a many-valued one when the element is
  // created. Read-only and set-once properties may be given their first value here.
  Builder& setOrAdd(const meta::Property& property, Value value);
  // The same with an element another builder creates in the same step (composite
  // properties: the child is created inside this element).
  Builder& setOrAdd(const meta::Property& property, std::unique_ptr<Builder> child);
  // A reference to the element of another builder of the same Orchestrator.
  Builder& setOrAddReference(const meta::Property& property, Builder* target);

  // Creates the element (a fresh UUID when `id` is nil) and applies the values, in one
  // transaction of the model. Raises "CannotCreateWithoutModel" without a model; a
  // failing value leaves nothing behind.
  ModelElement create(const Uuid& id = {});
  const ModelElement& getCreatedElement() const noexcept { return created_; }

  // A detached implementation of the builder's class.
  virtual IntrusivePtr<Impl> instantiate() = 0;

 protected:
  virtual void doSetOrAdd(Impl& element, const meta::Property& property, const Value& value);

 private:
  struct Entry {
    meta::Property property;
    Value value;
    std::unique_ptr<Builder> child;
    Builder* reference = nullptr;
  };
  void make();
  void apply();

  Model model_;
  Uuid uuid_{};
  std::vector<Entry> entries_;
  ModelElement created_;
};

// Creates the elements of several builders that refer to one another: every element first,
// then every value, in one transaction. It owns its builders.
class ModelElement::Builder::Orchestrator {
 public:
  explicit Orchestrator(Model model) : model_(std::move(model)) {}
  // The orchestrator owns the builder; the pointer names it in setOrAddReference.
  Builder* addBuilder(std::unique_ptr<Builder> builder);
  // Creates every element, then applies every value, in one transaction.
  void commit();
  ModelElement getCreatedElement(const Builder* builder) const { return builder->getCreatedElement(); }

 private:
  Model model_;
  std::vector<std::unique_ptr<Builder>> builders_;
};

// The builder of classes that have no generated code: elements are DynamicElementImpl.
class DynamicElementBuilder final : public ModelElement::Builder {
 public:
  DynamicElementBuilder(meta::Class metaClass, Model model)
      : Builder(std::move(model), 0), metaClass_(std::move(metaClass)) {}
  IntrusivePtr<ModelElement::Impl> instantiate() override;

 private:
  meta::Class metaClass_;
};

}  // namespace qf::zero
