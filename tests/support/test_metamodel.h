// A run-time metamodel that uses every property kind, and a canonical text dump of a
// model read through the reflective API only, for comparing model states in tests.
#pragma once

#include "qf/zero/core/meta/enum.h"
#include "qf/zero/core/meta/meta_registry.h"
#include "qf/zero/core/model_impl.h"
#include "qf/zero/core/primitive_collection.h"
#include "qf/zero/core/reference_collection.h"

#include <string>

namespace support {

// Package "tm": class Node with
//   1 name      String, single, default "", the key of "index"
//   2 count     Integer, single, default "7"
//   3 kind      enum Kind {Plain, Fancy}, single
//   4 tags      set of String
//   5 children  ordered containment of Node, opposite "parent"
//   6 parent    single Node, opposite "children"
//   7 friends   set of Node, opposite of itself (symmetric)
//   8 best      single Node, no opposite
//   9 index     map of Node keyed by "name"
//  10 born      optional DateTime
//  11 code      UUID, read-only and set-once
// class Leaf, a subclass of Node adding 12 weight (Integer), and class Gadget, a
// subclass of Leaf adding the remaining kinds of attribute:
//  13 flag      Boolean, default "true"
//  14 note      JsonValue, single
//  15 scores    ordered sequence of Integer
//  16 spot      optional datatype Point {x, y: Integer}
//  17 scratch   String, transient
struct Point {
  int x = 0;
  int y = 0;
  friend bool operator==(const Point&, const Point&) = default;
};

struct TestMetamodel {
  qf::zero::Model metaModel = qf::zero::Model::create();
  qf::zero::meta::Package package;
  qf::zero::meta::Enum kindEnum;
  qf::zero::meta::Class node, leaf, gadget;
  qf::zero::meta::DataType point;
  qf::zero::meta::Property name, count, kind, tags, children, parent, friends, best, index, born, code,
      weight;
  qf::zero::meta::Property flag, note, scores, spot, scratch, pointX, pointY;

  TestMetamodel();
  ~TestMetamodel();
  TestMetamodel(const TestMetamodel&) = delete;
  TestMetamodel& operator=(const TestMetamodel&) = delete;

  qf::zero::ReferenceCollection* refs(const qf::zero::ModelElement& e,
                                      const qf::zero::meta::Property& p) const;
  qf::zero::PrimitiveCollection* values(const qf::zero::ModelElement& e,
                                        const qf::zero::meta::Property& p) const;
  void setName(qf::zero::ModelElement& e, const std::u16string& value) const;
};

// Every live element (top-level first, then depth-first through containment), each
// with its class, UUID, container and every property value. Two models with equal
// dumps are equal as far as the reflective API can tell. Transient properties are
// left out on request, for comparing a model with one read back from a document.
std::string dumpModel(const qf::zero::Model& model, bool includeTransient = true);

}  // namespace support
