#include "kiv/protocol/terminator_model_builder.h"

#include "qf/zero/core/internal/element_impl.h"
#include "qf/zero/core/meta/structured_type.h"
#include "qf/zero/core/model_impl.h"

namespace kiv::protocol {

namespace {

bool fits(const qf::zero::ModelElement& element, const qf::zero::meta::Class& metaClass) {
  return element.getMetaClass()->isSubclassOf(metaClass);
}

}  // namespace

qf::zero::ModelElement TerminatorModelBuilder::findReference(const qf::zero::Model& model,
                                                             const qf::zero::meta::Class& metaClass,
                                                             const qf::zero::io::ElementId& id) {
  if (!id.uuid || id.uuid->is_nil()) return {};
  const qf::zero::ModelElement here =
      model->findElement(*id.uuid, qf::zero::FindElementBehavior::IncludeProxies);
  if (here) return fits(here, metaClass) ? here : qf::zero::ModelElement();
  if (known_) {
    const qf::zero::ModelElement there = known_->findElement(*id.uuid);
    if (!there || !there.isLive() || !fits(there, metaClass)) return {};
  }
  return qf::zero::ModelElement::Impl::createProxy(model.getImpl(), metaClass,
                                                   qf::zero::ProxyId{*id.uuid, u""});
}

}  // namespace kiv::protocol
