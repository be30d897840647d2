// Built by tools/check-package with nothing but the flags of the installed kiv.pc:
//   c++ -std=c++20 pkg_config_check.cpp $(pkg-config --cflags --libs kiv)
// A link or include path missing from kiv.pc fails the build; the run checks that what was
// linked works: a transaction of the user model becomes a commit on the head branch.
#include "kiv/kiv.h"

#include <iostream>

int main() {
  kiv::MetaPackageKiv::getInstance();
  const qf::zero::Model repositories = qf::zero::Model::create();
  const qf::zero::Model user = qf::zero::Model::create();
  const kiv::LocalRepository repository = kiv::LocalRepository::create(repositories, user);
  repository->init(kiv::RepoType::Regular);
  const kiv::Workspace workspace = repository->getWorkspace(user);
  // A transaction that changes nothing is still a commit.
  workspace->commitTransaction([] {});
  if (!repository->getHead()->getTip()) {
    std::cerr << "pkg_config_check: the transaction made no commit\n";
    return 1;
  }
  std::cout << "pkg_config_check: built with kiv.pc's flags alone, a commit was made\n";
  return 0;
}
