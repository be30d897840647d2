#include "qf/zero/core/owned_collection.h"

#include "qf/zero/core/model_impl.h"

namespace qf::zero {

std::vector<ModelElement::Impl::CollectionEdit>* AbstractOwnedCollection::modifying() {
  return owner_->notifyCollectionModifying(property_.getIndex());
}

AbstractOwnedCollection::Operation::Operation(AbstractOwnedCollection& collection) {
  collection.owner_->checkModifiable();
  transaction_ = collection.owner_->getModelImpl()->beginTransaction(false);
}

void AbstractOwnedCollection::Operation::commit() { transaction_.commit(); }

}  // namespace qf::zero
