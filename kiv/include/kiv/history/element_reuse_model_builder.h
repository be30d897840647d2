// ElementReuseModelBuilder: the model builder through which stored element content is
// turned back into live elements.
//
//   io::JSONParser parser(std::make_unique<io::ParseCustomizer>(),
//                         std::make_unique<kiv::ElementReuseModelBuilder>());
//   parser.parseVerbatim(document, userModel);   // existing elements are refreshed in place
//
// An entry whose UUID names a live element of the model refreshes that element instead
// of creating a second one; any other entry creates a new element as usual.
#pragma once

#include "qf/zero/io/model_builder.h"

namespace kiv {

// Reads stored content back into a model that may still hold its elements: a live element
// with an entry's UUID is refreshed in place, so handles to it stay valid.
class ElementReuseModelBuilder : public qf::zero::io::ElementReusingModelBuilder {
 public:
  // `reuse` marks a builder that refreshes elements which other elements still refer to:
  // clearing a reference before it is refilled then leaves the many-valued opposite ends
  // unresolved, so that no proxy is loaded and no opposite end is disturbed.
  explicit ElementReuseModelBuilder(bool reuse = true) : reuse_(reuse) {}

  bool isReuse() const noexcept { return reuse_; }

  // Empties a many-valued property of a reused element before the parse refills it:
  // primitive values and references alike, the latter without resolving proxies when
  // reusing a non-containment reference whose opposite is many-valued.
  void clearObjectValue(qf::zero::ModelElement& element, const qf::zero::meta::Property& property) override;

 private:
  bool reuse_;
};

}  // namespace kiv
