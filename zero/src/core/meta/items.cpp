// Accessors and factories of the metamodel items.
#include "qf/zero/core/messages.h"
#include "qf/zero/core/meta/enum.h"
#include "qf/zero/core/meta/framework_package.h"
#include "qf/zero/core/meta/operation.h"
#include "qf/zero/core/meta/package.h"
#include "qf/zero/core/meta/structured_type.h"
#include "qf/zero/core/model_impl.h"
#include "qf/zero/core/report_exception.h"

namespace qf::zero::meta {

namespace {

template <class Handle, class ImplT, class... Args>
Handle make(const Model& model, const Uuid& id, Args&&... args) {
  auto* impl = new ImplT(std::forward<Args>(args)...);
  Handle handle(impl);
  NamedElement::Impl::adoptItem(*impl, model, id);
  return handle;
}

template <class Handle>
Handle handleOf(ModelElement::Impl* impl) {
  return impl ? Handle(impl) : Handle();
}

}  // namespace

// ---- NamedElement ---------------------------------------------------------------

Class NamedElement::Impl::getMetaClass() const { return frameworkMetaClass(metaClassName()); }

Value NamedElement::Impl::basicGetValue(const Property& property) const {
  reportException(qf0::messages::NoSuchProperty(std::u16string(metaClassName()), property.getName()));
}
void NamedElement::Impl::basicSetValue(const Property& property, const Value&) {
  reportException(qf0::messages::NoSuchProperty(std::u16string(metaClassName()), property.getName()));
}
AbstractOwnedCollection* NamedElement::Impl::basicGetCollection(const Property& property) const {
  reportException(qf0::messages::NoSuchProperty(std::u16string(metaClassName()), property.getName()));
}

void NamedElement::Impl::adoptItem(ModelElement::Impl& item, const Model& model, const Uuid& id) {
  item.adoptInto(model.getImpl(), id);
}

// ---- types --------------------------------------------------------------------

Package Type::Impl::getOwningPackage() const { return handleOf<Package>(owningPackage_.get()); }
void Type::Impl::setOwningPackage(const Package& package) { owningPackage_.reset(package.getImpl()); }
void Type::Impl::invalidate() { owningPackage_.reset(); }

bool Type::conformsTo(const Type& other) const {
  if (*this == other) return true;
  if (!getImpl()->isClass() || !other || !other->isClass()) return false;
  return Class(getImpl())->isSubclassOf(Class(other.getImpl()));
}

PrimitiveType PrimitiveType::create(const Model& model, const Uuid& id, std::u16string name,
                                    std::u16string qualifiedName, std::shared_ptr<const ValueTraits> traits) {
  return make<PrimitiveType, Impl>(model, id, std::move(name), std::move(qualifiedName), std::move(traits));
}

DataType DataType::create(const Model& model, const Uuid& id, std::u16string name,
                          std::u16string qualifiedName) {
  return make<DataType, Impl>(model, id, std::move(name), std::move(qualifiedName));
}

Enum Enum::create(const Model& model, const Uuid& id, std::u16string name, std::u16string qualifiedName) {
  return make<Enum, Impl>(model, id, std::move(name), std::move(qualifiedName));
}

void Enum::Impl::addLiteral(const EnumLiteral& literal) {
  literals_.push_back(literal);
  literal->setParentEnum(Enum(this));
}
EnumLiteral Enum::Impl::findLiteral(std::u16string_view name) const {
  for (const EnumLiteral& literal : literals_) {
    if (literal.getName() == name) return literal;
  }
  return EnumLiteral();
}
EnumLiteral Enum::Impl::findLiteral(int value) const {
  for (const EnumLiteral& literal : literals_) {
    if (literal.getValue() == value) return literal;
  }
  return EnumLiteral();
}
Type Enum::Impl::getUnderlyingType() const { return handleOf<Type>(underlyingType_.get()); }
void Enum::Impl::setUnderlyingType(const Type& type) { underlyingType_.reset(type.getImpl()); }
void Enum::Impl::invalidate() {
  literals_.clear();
  underlyingType_.reset();
  Type::Impl::invalidate();
}

EnumLiteral EnumLiteral::create(const Model& model, const Uuid& id, std::u16string name, int value) {
  return make<EnumLiteral, Impl>(model, id, std::move(name), value);
}
Enum EnumLiteral::Impl::getParentEnum() const { return handleOf<Enum>(parent_); }
void EnumLiteral::Impl::setParentEnum(const Enum& parent) { parent_ = parent.getImpl(); }

// ---- structured types ------------------------------------------------------------

void StructuredType::Impl::addProperty(const Property& property) {
  ownProperties_.push_back(property);
  property->setOwningType(StructuredType(this));
}

void StructuredType::Impl::addOperation(const Operation& operation) {
  ownOperations_.push_back(operation);
  operation->setOwningType(StructuredType(this));
}

Property StructuredType::Impl::findProperty(std::u16string_view name) const {
  for (const Property& property : getAllProperties()) {
    if (property.getName() == name) return property;
  }
  return Property();
}

Operation StructuredType::Impl::findOperation(std::u16string_view name, std::size_t argumentCount) const {
  for (const StructuredType& type : getSuperTypes()) {
    if (Operation found = type->findOperation(name, argumentCount)) return found;
  }
  for (const Operation& operation : ownOperations_) {
    if (operation.getName() == name && operation->getArguments().size() == argumentCount) return operation;
  }
  return Operation();
}

void StructuredType::Impl::invalidate() {
  ownProperties_.clear();
  ownOperations_.clear();
  Type::Impl::invalidate();
}

// ---- typed elements, properties, operations ---------------------------------------------

Type TypedElement::Impl::getType() const { return handleOf<Type>(type_.get()); }
void TypedElement::Impl::setType(const Type& type) { type_.reset(type.getImpl()); }
void TypedElement::Impl::invalidate() { type_.reset(); }

Property Property::create(const Model& model, const Uuid& id, std::u16string name, ValueFlags flags,
                          bool isComposite) {
  Property property = make<Property, Impl>(model, id, std::move(name), flags, isComposite);
  if (property->isMany()) property->setUpper(-1);
  if (flags == ValueFlags::Single) property->setLower(1);
  return property;
}

bool Property::Impl::isReference() const {
  const Type type = getType();
  return type && type->isClass();
}

StructuredType Property::Impl::getOwningType() const { return handleOf<StructuredType>(owningType_); }
void Property::Impl::setOwningType(const StructuredType& type) { owningType_ = type.getImpl(); }
Property Property::Impl::getOpposite() const { return handleOf<Property>(opposite_); }
void Property::Impl::setOpposite(const Property& opposite) { opposite_ = opposite.getImpl(); }
Property Property::Impl::getQualifiedBy() const { return handleOf<Property>(qualifiedBy_.get()); }
void Property::Impl::setQualifiedBy(const Property& key) { qualifiedBy_.reset(key.getImpl()); }

std::u16string Property::Impl::getQualifiedName() const {
  const StructuredType owner = getOwningType();
  return owner ? owner.getQualifiedName() + u"." + getName() : getName();
}

Value Property::Impl::getDefaultValue() const {
  if (isMany() || isReference()) return Value();
  const Type type = getType();
  if (auto enumeration = elementCast<Enum>(type)) {
    const auto& literals = enumeration->getLiterals();
    EnumLiteral literal = defaultText_ ? enumeration->findLiteral(*defaultText_)
                                       : (literals.empty() ? EnumLiteral() : literals.front());
    return literal ? Value::createElementValue(literal, Property(const_cast<Impl*>(this))) : Value();
  }
  auto primitive = elementCast<PrimitiveType>(type);
  if (!primitive || primitive->getTraits() == nullptr) return Value();
  if (defaultText_) {
    if (auto parsed = primitive->getTraits()->parseText(*defaultText_)) return *parsed;
  }
  if (isOptional()) return Value();
  return primitive->getTraits()->defaultValue();
}

void Property::Impl::invalidate() {
  qualifiedBy_.reset();
  TypedElement::Impl::invalidate();
}

Argument Argument::create(const Model& model, const Uuid& id, std::u16string name) {
  return make<Argument, Impl>(model, id, std::move(name));
}
Operation Argument::Impl::getOperation() const { return handleOf<Operation>(operation_); }
void Argument::Impl::setOperation(const Operation& operation) { operation_ = operation.getImpl(); }

Operation Operation::create(const Model& model, const Uuid& id, std::u16string name) {
  return make<Operation, Impl>(model, id, std::move(name));
}
void Operation::Impl::addArgument(const Argument& argument) {
  arguments_.push_back(argument);
  argument->setOperation(Operation(this));
}
StructuredType Operation::Impl::getOwningType() const { return handleOf<StructuredType>(owningType_); }
void Operation::Impl::setOwningType(const StructuredType& type) { owningType_ = type.getImpl(); }
void Operation::Impl::invalidate() {
  arguments_.clear();
  invoker_.reset();
  TypedElement::Impl::invalidate();
}

Value FunctionInvoker::invoke(ModelElement::Impl& target, std::vector<Value>& arguments) const {
  return function_(target, arguments);
}

// ---- packages -----------------------------------------------------------------------

Package Package::create(const Model& model, const Uuid& id, std::u16string uri, std::u16string name) {
  return make<Package, Impl>(model, id, std::move(uri), std::move(name));
}
Package Package::Impl::getParentPackage() const { return handleOf<Package>(parent_); }
void Package::Impl::setParentPackage(const Package& parent) {
  parent_ = parent.getImpl();
  if (parent) parent->subPackages_.push_back(Package(this));
}
void Package::Impl::addType(const Type& type) {
  types_.push_back(type);
  type->setOwningPackage(Package(this));
}
std::u16string Package::Impl::getQualifiedName() const {
  const Package parent = getParentPackage();
  const std::u16string prefix = parent ? parent->getQualifiedName() : std::u16string();
  if (prefix.empty()) return getName();
  return getName().empty() ? prefix : prefix + u"." + getName();
}
void Package::Impl::invalidate() {
  subPackages_.clear();
  types_.clear();
}

}  // namespace qf::zero::meta
