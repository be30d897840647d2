// AggregateModelTraverser: the traverser with which a repository writes one element and
// its aggregate (Repository::serializeAggregate).
//
// It remembers the qualified type name of the element being written. A reference or
// containment declared by exactly that type is written by what it is: a composite
// property as a containment, any other as a reference. Every other property keeps the
// category of a plain JSON traversal.
#pragma once

#include "qf/zero/io/model_traverser.h"

#include <string>

namespace kiv {

// Writes the references and containments that the type named at construction declares by
// what they are, so that an element of that type is written with its aggregate.
class AggregateModelTraverser : public qf::zero::io::JSONModelTraverser {
 public:
  explicit AggregateModelTraverser(std::u16string qualifiedTypeName)
      : qualifiedTypeName_(std::move(qualifiedTypeName)) {}

  qf::zero::io::PropertyCategory getPropertyCategory(const qf::zero::meta::Property& property) const override;

  const std::u16string& getQualifiedTypeName() const noexcept { return qualifiedTypeName_; }

 private:
  std::u16string qualifiedTypeName_;
};

}  // namespace kiv
