// AggregateCustomizer: what a packed history carries with it.
//
//   qf::zero::io::JSONSerializer serializer(std::make_unique<qf::zero::io::JSONModelTraverser>(),
//                                           std::make_unique<kiv::protocol::AggregateCustomizer>());
//   serializer.serialize(history, qf::zero::io::SerializationOutput::forIntermediateFormat(&document));
//
// A history is written with every branch, commit, delta and object storage of its five
// sets as entries of the same document, in a fixed order (branches, commits, deltas,
// storages; each group by UUID), so that equal histories give identical documents. Any
// other element is written alone; what it refers to is written by UUID. Default values
// are written.
#pragma once

#include "qf/zero/io/serialize_customizer.h"

namespace kiv::protocol {

// Writes a history with its branches, commits, deltas and storages in a fixed order, so that
// equal histories give identical documents.
class AggregateCustomizer : public qf::zero::io::SerializeCustomizer {
 public:
  AggregateCustomizer();
  std::vector<qf::zero::ModelElement> getAggregateMembers(
      const qf::zero::ModelElement& element) const override;
};

}  // namespace kiv::protocol
