// Ancestry as a yes-or-no question, answered with a visited set.
#pragma once

#include "kiv/metamodel/commit_impl.h"

namespace kiv::history {

// Whether `target` is `from` or one of its ancestors along any parents. Unlike the path
// walks this visits each commit once, so the answer costs at most the size of history
// also when it is "no" on a line with many merges.
bool reaches(const Commit& from, const Commit::Impl& target);

}  // namespace kiv::history
