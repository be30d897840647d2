// A seeded random editor of test-metamodel models: creates elements of every class,
// sets every kind of property, moves, links, unlinks and destroys. Refused edits are
// part of the game; each must leave the model as it was.
#pragma once

#include "qf/zero/core/uuid.h"
#include "support/test_metamodel.h"

#include <random>
#include <vector>

namespace support {

class RandomEditor {
 public:
  // With `reuseDestroyedUuids`, new elements now and then take the UUID of one destroyed
  // earlier. A change report cannot yet say that one transaction destroyed an element and
  // made another under its UUID, so only editors of rollback tests ask for it.
  RandomEditor(const TestMetamodel& tm, qf::zero::Model model, unsigned seed,
               bool reuseDestroyedUuids = false)
      : tm_(tm), model_(std::move(model)), random_(seed), reuseDestroyedUuids_(reuseDestroyedUuids) {}

  // One random edit. A refused edit must change nothing (checked with gtest asserts).
  void step();
  // Containment, opposites and map keys agree on both ends, and the model finds every
  // live element by its UUID and counts no other (checked with gtest asserts).
  void checkInvariants() const;

 private:
  std::vector<qf::zero::ModelElement> live() const;
  int pick(int n) { return std::uniform_int_distribution<int>(0, n - 1)(random_); }
  qf::zero::ModelElement any();
  std::u16string someName();
  void edit();
  void editGadget(qf::zero::ModelElement& gadget);

  // A UUID of an element destroyed earlier, when one is free, for a new element to take.
  qf::zero::Uuid reusedUuid();

  const TestMetamodel& tm_;
  qf::zero::Model model_;
  std::mt19937 random_;
  bool reuseDestroyedUuids_;
  std::vector<qf::zero::Uuid> destroyed_;
};

}  // namespace support
