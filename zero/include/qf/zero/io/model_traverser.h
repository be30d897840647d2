// ModelTraverser: which properties a traversal of an element visits, and as what.
//
// The JSON serializer asks the traverser for the properties to write; a subclass
// narrows or widens that (a repository's traverser, for instance, follows
// references that a plain traversal treats as links only).
#pragma once

#include "qf/zero/core/meta/property.h"
#include "qf/zero/core/meta/structured_type.h"

#include <unordered_map>
#include <vector>

namespace qf::zero::io {

enum class PropertyCategory {
  Attribute,    // a primitive, enumeration or datatype value
  Reference,    // a link to an element that is not owned
  Containment,  // an owned child
  All           // every category (a filter only)
};

// Decides which properties of a type a traversal visits, and as what. The answers are cached
// per type, so the metamodel must be complete before the first traversal.
class ModelTraverser {
 public:
  virtual ~ModelTraverser() = default;

  // The properties of `type` in `category` that are not transient, in index order.
  // The result is cached per type: the metamodel must be complete before a traversal.
  virtual const std::vector<meta::Property>& getProperties(const meta::StructuredType& type,
                                                           PropertyCategory category);
  virtual PropertyCategory getPropertyCategory(const meta::Property& property) const;
  virtual bool isPropertyTransient(const meta::Property& property) const;

 private:
  struct Key {
    const void* type;
    PropertyCategory category;
    friend bool operator==(const Key&, const Key&) = default;
  };
  struct KeyHash {
    std::size_t operator()(const Key& key) const noexcept {
      return std::hash<const void*>()(key.type) * 31 + static_cast<std::size_t>(key.category);
    }
  };
  std::unordered_map<Key, std::vector<meta::Property>, KeyHash> cache_;
};

// The traverser of JSON documents: transient properties and properties whose values
// have no persistent form (a transient-only serializer) are skipped.
class JSONModelTraverser : public ModelTraverser {
 public:
  bool isPropertyTransient(const meta::Property& property) const override;
};

}  // namespace qf::zero::io
