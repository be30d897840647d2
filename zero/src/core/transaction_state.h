// The bookkeeping of one model's open transaction: per touched element, which
// savepoint level created or destroyed it and the old-value storage of each level.
#pragma once

#include "qf/zero/core/change_report.h"
#include "qf/zero/core/internal/storage.h"
#include "qf/zero/core/value.h"

#include <boost/optional.hpp>

#include <cstdint>
#include <deque>
#include <memory>
#include <vector>

namespace qf::zero::internal {

struct ElementRecord {
  struct LevelStorage {
    int level;
    std::shared_ptr<ModelElement::Impl::Storage> storage;
  };

  IntrusivePtr<ModelElement::Impl> element;
  int createdLevel = -1;
  int destroyedLevel = -1;
  std::vector<LevelStorage> storages;  // ascending levels
  std::vector<int> listedLevels;       // levels whose record list holds this record, ascending
  bool dead = false;                   // holds nothing any more; skipped everywhere

  ModelElement::Impl::Storage* storageAt(int level) const {
    return !storages.empty() && storages.back().level == level ? storages.back().storage.get() : nullptr;
  }
  bool isEmpty() const { return createdLevel < 0 && destroyedLevel < 0 && storages.empty(); }
};

struct TransactionState {
  enum class Phase { Open, Validating, Modifying, Closing };

  struct Level {
    std::vector<ElementRecord*> records;  // touched at this level, first touch first
    bool aborted = false;                 // a joined operation failed after changing something
  };

  std::deque<ElementRecord> records;  // first-touch order
  std::vector<Level> levels;
  int openCount = 0;
  // Counts recorded changes; a joined operation that failed before the count moved
  // changed nothing and needs no abort.
  std::uint64_t changeCount = 0;
  Phase phase = Phase::Open;
  // Set by a prepare: the report its listeners passed, valid while changeCount stays at
  // preparedAt.
  std::shared_ptr<ReportData> preparedReport;
  std::uint64_t preparedAt = 0;
  bool prepared = false;

  int currentLevel() const noexcept { return static_cast<int>(levels.size()) - 1; }
  // Lists `record` at the current level (once).
  void list(ElementRecord& record) {
    const int level = currentLevel();
    if (record.listedLevels.empty() || record.listedLevels.back() != level) {
      record.listedLevels.push_back(level);
      levels.back().records.push_back(&record);
    }
  }
};

}  // namespace qf::zero::internal
