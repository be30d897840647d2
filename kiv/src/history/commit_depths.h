// The depth of each commit's ancestry, kept beside the history model: how many commits its
// longest way back to a root holds, and how many such longest ways there are. A recorded
// commit's ancestry does not change, so each commit is measured once; the measured commits
// are watched, and any change to one of them (a parent added) drops every measure.
#pragma once

#include "kiv/metamodel/commit.h"

#include <cstddef>
#include <cstdint>
#include <unordered_map>

namespace qf::zero {
class ModelImpl;
}

namespace kiv::history {

class CommitDepths {
 public:
  // The longest-way counts stop growing here: callers ask "one, two, or more".
  static constexpr std::size_t kManyWays = 3;

  struct Depth {
    std::size_t height = 0;       // commits on the longest way back, this one included
    std::size_t longestWays = 0;  // how many ways back are that long, up to kManyWays
  };

  static CommitDepths& of(qf::zero::ModelImpl& model);

  // REQUIRES: a live commit, or null for a parent that is not resident (height 1, one way).
  Depth of(const Commit& commit);

 private:
  struct Measured {
    Depth depth;
    Commit held;  // so that no other commit takes the address
  };
  std::uint64_t seenChanges_ = 0;
  std::unordered_map<const Commit::Impl*, Measured> depths_;
};

}  // namespace kiv::history
