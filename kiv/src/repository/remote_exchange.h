// What the local repository and its remote origin share on the client side: the lock
// that keeps the origin's exchanges, and the updates of the client's repository model
// that follow them, one at a time. A change notice pulls on the transport's thread while
// a push of the same client may be finishing on its worker; both touch the one model
// that holds the origin's proxy and the clone.
#pragma once

#include "kiv/metamodel/remote_repository.h"
#include "kiv/metamodel/repository.h"

#include <mutex>

namespace kiv {

struct RemoteExchangeLock {
  std::mutex mutex;
};

// The remote proxy that `repository` is, or a null handle for any other repository.
RemoteRepository asRemote(const Repository& repository);

// Holds `remote`'s exchange lock. Raises "ElementRequired" for a proxy that has no
// transport yet (setSynchronizationChannel makes the lock).
std::unique_lock<std::mutex> lockExchanges(const RemoteRepository& remote);

}  // namespace kiv
