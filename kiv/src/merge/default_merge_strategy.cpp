#include "kiv/merge/default_merge_strategy.h"

#include "kiv/merge/accept_theirs_merge_tool.h"
#include "kiv/merge/recursive_merge3_strategy.h"

namespace kiv {

std::shared_ptr<IMergeStrategy> makeDefaultMergeStrategy() {
  return std::make_shared<RecursiveMerge3Strategy>(std::make_unique<AcceptTheirsMergeTool>());
}

}  // namespace kiv
