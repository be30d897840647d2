#include "kiv/host_entry.h"

#include "kiv/metamodel/meta_package_kiv.h"

extern "C" void HXInitialize_kiv() { kiv::MetaPackageKiv::getInstance().initialize(); }

extern "C" void HXTerminate_kiv() {
  kiv::MetaPackageKiv& package = kiv::MetaPackageKiv::getInstance();
  if (package.isRegistered()) package.terminate();
}
