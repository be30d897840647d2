#include "kiv/metamodel/dependency_impl.h"
#include "kiv/metamodel/repository.h"

namespace kiv {

// The repository kind decides what loading means: Repository::load is abstract and each
// kind defines it. A dependency that belongs to no repository has nothing to load from.
void Dependency::Impl::load() {
  if (const Repository repository = getRepository(); repository && repository.isLive()) {
    repository.load(Dependency(this));
  }
}

}  // namespace kiv
