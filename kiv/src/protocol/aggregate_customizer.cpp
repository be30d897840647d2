#include "kiv/protocol/aggregate_customizer.h"

#include "kiv/metamodel/branch.h"
#include "kiv/metamodel/commit.h"
#include "kiv/metamodel/delta.h"
#include "kiv/metamodel/object_storage.h"
#include "kiv/metamodel/protocol/history_impl.h"

#include <algorithm>

namespace kiv::protocol {

namespace {

template <class Collection>
void appendSorted(std::vector<qf::zero::ModelElement>& out, const Collection& collection) {
  std::vector<qf::zero::ModelElement> group;
  for (const auto& element : collection.container()) {
    if (element && element.isLive()) group.emplace_back(element);
  }
  std::sort(group.begin(), group.end(),
            [](const auto& a, const auto& b) { return a.getUuid() < b.getUuid(); });
  out.insert(out.end(), group.begin(), group.end());
}

}  // namespace

AggregateCustomizer::AggregateCustomizer() { setShouldSkipDefaultValues(false); }

std::vector<qf::zero::ModelElement> AggregateCustomizer::getAggregateMembers(
    const qf::zero::ModelElement& element) const {
  std::vector<qf::zero::ModelElement> members;
  if (!element || element.getMetaClass() != History::metaClass()) return members;
  const History history = qf::zero::elementCast<History>(element);
  appendSorted(members, history.getPrevious());
  appendSorted(members, history.getCurrent());
  appendSorted(members, history.getCommits());
  appendSorted(members, history.getDeltas());
  appendSorted(members, history.getObjectStorages());
  return members;
}

}  // namespace kiv::protocol
