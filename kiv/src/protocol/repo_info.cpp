#include "kiv/metamodel/protocol/repo_info.h"

namespace kiv::protocol {

bool RepoInfo::compareWith(const RepoInfo& other) const { return *this == other; }

}  // namespace kiv::protocol
