// The two branch sets of a history ("previous" and "current"), reached by reflection: the
// history's class belongs to the protocol layer above the repositories; and the end of a
// history made for one exchange.
#pragma once

#include "kiv/metamodel/branch.h"
#include "kiv/metamodel/meta_package_kiv.h"
#include "kiv/metamodel/protocol/history.h"
#include "qf/zero/core/model_impl.h"
#include "qf/zero/core/reference_collection.h"
#include "qf/zero/core/transaction.h"
#include "qf/zero/core/value.h"

#include <vector>

namespace kiv::repository {

inline const qf::zero::meta::Property& branchSet(bool previous) {
  const MetaPackageKiv& package = MetaPackageKiv::getInstance();
  return previous ? package.getHistory_previous() : package.getHistory_current();
}

inline qf::zero::ReferenceCollection& collectionOf(const protocol::History& history, bool previous) {
  const qf::zero::Value held = history.getPropertyValue(branchSet(previous));
  return *static_cast<qf::zero::ReferenceCollection*>(held.getValue<qf::zero::AbstractOwnedCollection*>());
}

// The branches of one set, proxies included as they are held.
inline std::vector<Branch> branchesOf(const protocol::History& history, bool previous) {
  std::vector<Branch> result;
  for (const qf::zero::ModelElement& held : collectionOf(history, previous).getAllValuesAndProxies()) {
    result.push_back(qf::zero::elementCast<Branch>(held));
  }
  return result;
}

// Adds to one set. REQUIRES: an open transaction on the history's model.
inline void addBranch(const protocol::History& history, bool previous, const Branch& branch) {
  collectionOf(history, previous).add(branch);
}

// Destroys a history made for one exchange, in a transaction of its own. Raises nothing:
// a scratch element left behind loses nothing.
inline void dropHistory(const protocol::History& history) noexcept {
  try {
    if (history && history.isLive()) {
      qf::zero::Transaction transaction = history.getModel()->beginTransaction();
      protocol::History(history).destroy();
      transaction.commit();
    }
  } catch (...) {
  }
}

}  // namespace kiv::repository
