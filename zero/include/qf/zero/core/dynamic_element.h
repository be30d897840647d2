// DynamicElementImpl: an element of a class defined at run time, its values held
// reflectively, one slot per property index.
#pragma once

#include "qf/zero/core/internal/element_impl.h"
#include "qf/zero/core/meta/structured_type.h"
#include "qf/zero/core/owned_collection.h"
#include "qf/zero/core/value.h"

#include <memory>
#include <vector>

namespace qf::zero {

// The implementation of every element whose class has no generated code; its values are
// reached reflectively only.
class DynamicElementImpl final : public ModelElement::Impl {
 public:
  explicit DynamicElementImpl(meta::Class metaClass);
  ~DynamicElementImpl() override;

  meta::Class getMetaClass() const override { return metaClass_; }
  Value basicGetValue(const meta::Property& property) const override;
  void basicSetValue(const meta::Property& property, const Value& value) override;
  AbstractOwnedCollection* basicGetCollection(const meta::Property& property) const override;

 private:
  std::size_t slotOf(const meta::Property& property) const;

  meta::Class metaClass_;
  std::vector<Value> values_;
  std::vector<std::unique_ptr<AbstractOwnedCollection>> collections_;
};

}  // namespace qf::zero
