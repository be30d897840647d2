// The merged state as a three-way comparison leaves it in its first delta (a snapshot of
// the whole merged state), read and rewritten entry by entry. Entries are parsed when
// first read; rewritten ones become storages when the merge is written back.
#pragma once

#include "history/composed_state.h"
#include "history/history_support.h"
#include "kiv/metamodel/delta_impl.h"
#include "qf/zero/core/internal/flat_table.h"
#include "qf/zero/core/meta/framework_package.h"

#include <nlohmann/json.hpp>

#include <optional>
#include <unordered_map>
#include <vector>

namespace kiv::merge {

class MergedState {
 public:
  // `base`: the current entries of the base's snapshot.
  MergedState(Delta::Impl& merged, const history::StateEntries& base);

  // The element's merged entry; null when the merged state does not hold the element.
  const qf::zero::JsonValue* find(const qf::zero::Uuid& uuid);
  // The element's entry in the base; null when the base does not hold it.
  const qf::zero::JsonValue* findInBase(const qf::zero::Uuid& uuid);
  // Deleted by the merge: the first delta has its previous entry and no current one.
  bool isDeleted(const qf::zero::Uuid& uuid);
  // The entry a deletion removes.
  qf::zero::JsonValue deletedEntry(const qf::zero::Uuid& uuid) const;

  // Sets the element's merged entry. `sameAs`: storages whose content may equal it, to
  // be shared instead of stored again.
  void put(const qf::zero::Uuid& uuid, qf::zero::JsonValue entry, std::vector<ObjectStorage> sameAs = {});

  // The elements whose merged entry is not the base's: what a side or the merge changed.
  std::vector<qf::zero::Uuid> changed() const;

  // Stores every entry put, in the first delta; an element new to it is recorded against
  // its base entry when the base has one.
  void write();

 private:
  struct Rewrite {
    std::vector<ObjectStorage> sameAs;
  };
  using Hash = qf::zero::internal::KeyedUuidHash;

  ObjectStorage baseEntry(const qf::zero::Uuid& uuid) const;

  Delta::Impl& merged_;
  const history::StateEntries& base_;
  std::unordered_map<qf::zero::Uuid, qf::zero::JsonValue, Hash> entries_;
  std::unordered_map<qf::zero::Uuid, qf::zero::JsonValue, Hash> baseEntries_;
  std::unordered_map<qf::zero::Uuid, Rewrite, Hash> rewritten_;
  mutable std::optional<std::vector<qf::zero::Uuid>> comparedChanges_;
};

}  // namespace kiv::merge
