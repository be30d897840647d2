// Operation and Argument: callable features of a class, invoked reflectively
// through an invoker (ModelElement::Impl::invoke).
#pragma once

#include "qf/zero/core/meta/property.h"

#include <functional>
#include <memory>
#include <vector>

namespace qf::zero::meta {

// Unpacks argument values, calls the operation on the element, packs the result.
class AbstractMethodInvoker {
 public:
  virtual ~AbstractMethodInvoker() = default;
  // REQUIRES: arguments.size() equals the operation's argument count.
  virtual Value invoke(ModelElement::Impl& target, std::vector<Value>& arguments) const = 0;
};

// An invoker over any callable: for operations of run-time metamodels.
class FunctionInvoker final : public AbstractMethodInvoker {
 public:
  using Function = std::function<Value(ModelElement::Impl&, std::vector<Value>&)>;
  explicit FunctionInvoker(Function function) : function_(std::move(function)) {}
  Value invoke(ModelElement::Impl& target, std::vector<Value>& arguments) const override;

 private:
  Function function_;
};

// One parameter of an operation, typed and bounded like a property.
class Argument : public TypedElement {
  QF_ZERO_HANDLE(Argument, TypedElement)
  static Argument create(const Model& model, const Uuid& id, std::u16string name);
};

// An argument's direction (input unless set otherwise) and the operation that owns it.
class Argument::Impl : public TypedElement::Impl {
 public:
  explicit Impl(std::u16string name) : TypedElement::Impl(std::move(name)) {}
  bool isInput() const noexcept { return isInput_; }
  void setIsInput(bool value) noexcept { isInput_ = value; }
  Operation getOperation() const;
  void setOperation(const Operation& operation);

 protected:
  std::u16string_view metaClassName() const override { return u"Argument"; }

 private:
  bool isInput_ = true;
  ModelElement::Impl* operation_ = nullptr;  // the owner; raw to avoid a cycle
};

// A callable feature of a class, typed by its result; called reflectively through
// ModelElement::invoke.
class Operation : public TypedElement {
  QF_ZERO_HANDLE(Operation, TypedElement)
  static Operation create(const Model& model, const Uuid& id, std::u16string name);
};

// An operation's arguments, owning type, flags and invoker; without an invoker it cannot be
// called reflectively.
class Operation::Impl : public TypedElement::Impl {
 public:
  explicit Impl(std::u16string name) : TypedElement::Impl(std::move(name)) {}
  const std::vector<Argument>& getArguments() const noexcept { return arguments_; }
  void addArgument(const Argument& argument);
  StructuredType getOwningType() const;
  void setOwningType(const StructuredType& type);
  bool isAbstract() const noexcept { return isAbstract_; }
  void setIsAbstract(bool value) noexcept { isAbstract_ = value; }
  bool isStatic() const noexcept { return isStatic_; }
  void setIsStatic(bool value) noexcept { isStatic_ = value; }
  bool isPublic() const noexcept { return isPublic_; }
  void setIsPublic(bool value) noexcept { isPublic_ = value; }
  bool isEvent() const noexcept { return isEvent_; }
  void setIsEvent(bool value) noexcept { isEvent_ = value; }
  // Null when the operation cannot be called reflectively.
  const AbstractMethodInvoker* getInvoker() const noexcept { return invoker_.get(); }
  void setInvoker(std::unique_ptr<AbstractMethodInvoker> invoker) { invoker_ = std::move(invoker); }
  void invalidate() override;

 protected:
  std::u16string_view metaClassName() const override { return u"Operation"; }

 private:
  std::vector<Argument> arguments_;
  ModelElement::Impl* owningType_ = nullptr;
  bool isAbstract_ = false;
  bool isStatic_ = false;
  bool isPublic_ = true;
  bool isEvent_ = false;
  std::unique_ptr<AbstractMethodInvoker> invoker_;
};

}  // namespace qf::zero::meta
