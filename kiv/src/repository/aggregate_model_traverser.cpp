#include "kiv/repository/aggregate_model_traverser.h"

#include "qf/zero/core/meta/property.h"
#include "qf/zero/core/meta/structured_type.h"

namespace kiv {

qf::zero::io::PropertyCategory AggregateModelTraverser::getPropertyCategory(
    const qf::zero::meta::Property& property) const {
  using qf::zero::io::PropertyCategory;
  const PropertyCategory base = JSONModelTraverser::getPropertyCategory(property);
  if (base != PropertyCategory::Reference && base != PropertyCategory::Containment) return base;
  const qf::zero::meta::StructuredType owner = property->getOwningType();
  if (!owner || owner->getQualifiedName() != qualifiedTypeName_) return base;
  return property->isComposite() ? PropertyCategory::Containment : PropertyCategory::Reference;
}

}  // namespace kiv
