#include "kiv/metamodel/dependency_impl.h"

#include "kiv/metamodel/repository_impl.h"

namespace kiv {

// The repository kind decides what loading means. A dependency that belongs to no
// repository has nothing to load from.
void Dependency::Impl::load() {
  if (const Repository repository = getRepository(); repository && repository.isLive()) {
    repository->load(Dependency(this));
  }
}

}  // namespace kiv
