#include "qf/zero/core/value.h"

#include "qf/zero/core/owned_collection.h"

namespace qf::zero {

Value Value::createElementValue(const ModelElement& element, const meta::Property& property) {
  return of(element, ValueMeta(property));
}

Value Value::list(std::vector<Value> items, const meta::Property& property) {
  return of(std::move(items), ValueMeta(property));
}

Value Value::collectionView(AbstractOwnedCollection* collection, const meta::Property& property) {
  Value value = of(collection, ValueMeta(property));
  value.meta_.setUnmanaged();
  return value;
}

const std::vector<Value>& Value::getList() const {
  if (!holds<std::vector<Value>>()) raiseIncompatible<std::vector<Value>>();
  return static_cast<const TypedHolder<std::vector<Value>>&>(*holder_).value;
}

const std::type_info& Value::heldType() const noexcept {
  switch (kind_) {
    case Kind::Empty:
      return typeid(void);
    case Kind::Element:
      return typeid(ModelElement);
    case Kind::Other:
      break;
  }
  return holder_->type();
}

AbstractOwnedCollection* Value::collectionPointer() const noexcept {
  if (!holds<AbstractOwnedCollection*>()) return nullptr;
  return static_cast<const TypedHolder<AbstractOwnedCollection*>&>(*holder_).value;
}

bool operator==(const Value& a, const Value& b) {
  if (a.kind_ != b.kind_) return false;
  switch (a.kind_) {
    case Value::Kind::Empty:
      return true;
    case Value::Kind::Element:
      return a.element_ == b.element_;
    case Value::Kind::Other:
      break;
  }
  return a.holder_ == b.holder_ || a.holder_->equals(*b.holder_);
}

}  // namespace qf::zero
