// The strategy a local repository merges with unless told otherwise.
#pragma once

#include "kiv/merge/merge_strategy.h"

#include <memory>

namespace kiv {

// Recursive three-way merge with the accept-theirs tool: an element both sides changed
// differently takes theirs whole.
std::shared_ptr<IMergeStrategy> makeDefaultMergeStrategy();

}  // namespace kiv
