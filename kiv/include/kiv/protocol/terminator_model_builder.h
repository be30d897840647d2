// TerminatorModelBuilder: the model builder that reads a received history.
//
// A history document carries only what the receiver lacks, so its entries refer to
// commits, deltas and storages that are not in it. The builder ends the graph there:
//  - a reference to an element of the target model resolves to it when its class fits;
//  - a reference to an element neither in the document nor in the target model becomes a
//    proxy that stands for it, when `known` is null or holds that element (of a fitting
//    class); otherwise it is dangling and the parse fails ("DanglingReference").
// The history's parse customizer, not this builder, keeps entries that the target model
// already holds from being read again: recorded history is immutable.
// `known` is the model whose elements a history may refer to without carrying them (the
// receiving repository's model); it is only read, from the parsing thread.
#pragma once

#include "qf/zero/core/model.h"
#include "qf/zero/io/model_builder.h"

namespace kiv::protocol {

// Reads a received history, which refers to commits, deltas and storages it does not carry:
// such a reference resolves to the receiver's element or becomes a proxy, else the parse fails.
class TerminatorModelBuilder : public qf::zero::io::ModelBuilder {
 public:
  explicit TerminatorModelBuilder(qf::zero::Model known = qf::zero::Model()) : known_(std::move(known)) {}

  qf::zero::ModelElement findReference(const qf::zero::Model& model, const qf::zero::meta::Class& metaClass,
                                       const qf::zero::io::ElementId& id) override;

 private:
  qf::zero::Model known_;
};

}  // namespace kiv::protocol
