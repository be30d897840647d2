// IMergeTool: settles what a three-way comparison of two lines leaves open.
//
// A three-way merge strategy computes, from the common ancestor, ours and theirs, the
// three deltas of its comparison and lets its tool turn them into the one delta that
// the merged commit records.
#pragma once

#include "kiv/metamodel/commit.h"
#include "kiv/metamodel/delta.h"

#include <vector>

namespace kiv {

// Turns the three deltas of a three-way comparison into the one delta the merged commit
// records, deciding what the comparison left open. Called by the strategy that owns it.
class IMergeTool {
 public:
  virtual ~IMergeTool() = default;

  // The merged delta, built from `deltas` (the three-way comparison of ancestor, ours
  // and theirs); it may be one of them, changed in place.
  virtual Delta run(const Commit& ancestor, const Commit& ours, const Commit& theirs,
                    const std::vector<Delta>& deltas) const = 0;
};

}  // namespace kiv
