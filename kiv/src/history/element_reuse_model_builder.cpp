#include "kiv/history/element_reuse_model_builder.h"

#include "qf/zero/core/internal/element_impl.h"
#include "qf/zero/core/meta/property.h"
#include "qf/zero/core/owned_collection.h"
#include "qf/zero/core/value.h"

namespace kiv {

namespace {

bool hasManyValuedOpposite(const qf::zero::meta::Property& property) {
  const qf::zero::meta::Property opposite = property->getOpposite();
  return opposite && (opposite->getUpper() < 0 || opposite->getUpper() > 1);
}

}  // namespace

void ElementReuseModelBuilder::clearObjectValue(qf::zero::ModelElement& element,
                                                const qf::zero::meta::Property& property) {
  const bool unresolvedView =
      property->isReference() && reuse_ && !property->isContainment() && hasManyValuedOpposite(property);
  const qf::zero::AccessTag tag =
      unresolvedView ? qf::zero::AccessTag::NoProxyResolve : qf::zero::AccessTag::Default;
  element->getPropertyValue(property, tag).getValue<qf::zero::AbstractOwnedCollection*>()->genericClear();
}

}  // namespace kiv
