// SerializeCustomizer: the choices a serializer leaves to its user.
#pragma once

#include "qf/zero/core/model_element.h"
#include "qf/zero/io/json_constants.h"

#include <string>
#include <vector>

namespace qf::zero::io {

// Decides what a serializer writes beyond the element itself: whether default values are
// written, the format version, and the elements written with it.
class SerializeCustomizer {
 public:
  virtual ~SerializeCustomizer() = default;

  // When true, properties holding their default value (and empty many-valued
  // properties) are not written. A document is then smaller but a parse into an
  // element that already holds other values does not reset them.
  bool shouldSkipDefaultValues() const noexcept { return skipDefaults_; }
  void setShouldSkipDefaultValues(bool skip) noexcept { skipDefaults_ = skip; }

  const std::string& getFormatVersion() const noexcept { return version_; }
  void setFormatVersion(std::string version) { version_ = std::move(version); }

  // The aggregate written with an element: the elements returned here are written as
  // entries after it, each at most once, and asked in turn for theirs. The default
  // writes the element alone; its references and children are written by UUID.
  virtual std::vector<ModelElement> getAggregateMembers(const ModelElement& element) const;

 private:
  bool skipDefaults_ = false;
  std::string version_ = JSONConstants::FORMAT_VERSION;
};

// Writes an element with its whole contained subtree.
class ContainmentAggregateCustomizer : public SerializeCustomizer {
 public:
  std::vector<ModelElement> getAggregateMembers(const ModelElement& element) const override;
};

}  // namespace qf::zero::io
