// The two branch sets of a history ("previous" and "current"), reached by reflection: the
// history's class belongs to the protocol layer above the repositories.
#pragma once

#include "kiv/metamodel/branch.h"
#include "kiv/metamodel/meta_package_kiv.h"
#include "kiv/metamodel/protocol/history.h"
#include "qf/zero/core/value.h"

#include <vector>

namespace kiv::repository {

inline const qf::zero::meta::Property& branchSet(bool previous) {
  const MetaPackageKiv& package = MetaPackageKiv::getInstance();
  return previous ? package.getHistory_previous() : package.getHistory_current();
}

// The branches of one set, proxies included as they are held.
inline std::vector<Branch> branchesOf(const protocol::History& history, bool previous) {
  std::vector<Branch> result;
  const qf::zero::Value held = history.getPropertyValue(branchSet(previous));
  if (!held.isList()) return result;
  for (const qf::zero::Value& item : held.getList()) {
    result.push_back(qf::zero::elementCast<Branch>(item.getElement()));
  }
  return result;
}

// Replaces one set. REQUIRES: an open transaction on the history's model.
inline void setBranches(protocol::History& history, bool previous, const std::vector<Branch>& branches) {
  const qf::zero::meta::Property& property = branchSet(previous);
  std::vector<qf::zero::Value> items;
  items.reserve(branches.size());
  for (const Branch& branch : branches)
    items.push_back(qf::zero::Value::createElementValue(branch, property));
  history.setPropertyValue(property, qf::zero::Value::list(std::move(items), property));
}

}  // namespace kiv::repository
