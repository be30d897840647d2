// A seeded random editor of test-metamodel models: creates elements of every class,
// sets every kind of property, moves, links, unlinks and destroys. Refused edits are
// part of the game; each must leave the model as it was.
#pragma once

#include "support/test_metamodel.h"

#include <random>
#include <vector>

namespace support {

class RandomEditor {
 public:
  RandomEditor(const TestMetamodel& tm, qf::zero::Model model, unsigned seed)
      : tm_(tm), model_(std::move(model)), random_(seed) {}

  // One random edit. A refused edit must change nothing (checked with gtest asserts).
  void step();
  // Containment, opposites and map keys agree on both ends (checked with gtest asserts).
  void checkInvariants() const;

 private:
  std::vector<qf::zero::ModelElement> live() const;
  int pick(int n) { return std::uniform_int_distribution<int>(0, n - 1)(random_); }
  qf::zero::ModelElement any();
  std::u16string someName();
  void edit();
  void editGadget(qf::zero::ModelElement& gadget);

  const TestMetamodel& tm_;
  qf::zero::Model model_;
  std::mt19937 random_;
};

}  // namespace support
