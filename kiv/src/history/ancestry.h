// Ancestry as a yes-or-no question, answered with a visited set.
#pragma once

#include "kiv/metamodel/commit_impl.h"

#include <functional>

namespace kiv::history {

// Whether `target` is `from` or one of its ancestors along any parents. Unlike the path
// walks this visits each commit once, so the answer costs at most the size of history
// also when it is "no" on a line with many merges. It measures no depths: recording a
// history asks it while parents are still being added, which would drop every measure.
bool reaches(const Commit& from, const Commit::Impl& target);

// Whether a walk from `from` toward `target` may go on into a commit: false for one no
// taller than the target (other than the target itself), whose ancestors cannot hold it.
// Always true when the two are not live commits of one model.
std::function<bool(const Commit&)> mayLeadTo(const Commit& from, const Commit& target);

}  // namespace kiv::history
