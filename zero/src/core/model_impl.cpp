#include "qf/zero/core/model_impl.h"

#include "core/transaction_state.h"
#include "qf/zero/core/internal/storage.h"
#include "qf/zero/core/messages.h"
#include "qf/zero/core/meta/structured_type.h"
#include "qf/zero/core/report_exception.h"

#include <algorithm>
#include <cstring>
#include <exception>
#include <iterator>

namespace qf::zero {

using internal::ElementRecord;
using internal::TransactionState;

Model::Model() noexcept = default;
Model::Model(ModelImpl* impl) noexcept : impl_(impl) {}
Model::Model(const Model& other) noexcept = default;
Model::Model(Model&& other) noexcept = default;
Model& Model::operator=(const Model& other) noexcept = default;
Model& Model::operator=(Model&& other) noexcept = default;
Model::~Model() = default;

Model Model::create(const Uuid& id, ModelConstellation constellation) {
  return Model(new ModelImpl(id.is_nil() ? generateNewUuid() : id, constellation));
}

Model::Freezer::Freezer(const Model& model) : model_(model.getImpl()) { ++model_->freezeCount_; }
Model::Freezer::~Freezer() { thaw(); }
void Model::Freezer::thaw() noexcept {
  if (model_) --model_->freezeCount_;
  model_.reset();
}

Model::Thawer::Thawer(const Model& model) : model_(model.getImpl()) { ++model_->thawCount_; }
Model::Thawer::~Thawer() { --model_->thawCount_; }

Transaction TransactionFactory::beginTransaction(bool savepoint) const {
  return model_->beginTransaction(savepoint);
}

ModelImpl::ModelImpl(const Uuid& id, ModelConstellation constellation)
    : uuid_(id), constellation_(constellation), elements_(internal::randomTableSeed()) {}

ModelImpl::~ModelImpl() {
  // Every element outlives its model only as an invalid shell: break the references
  // between them first, then cut them loose.
  std::vector<IntrusivePtr<ModelElement::Impl>> all;
  all.reserve(elements_.size());
  elements_.forEach(
      [&all](const Uuid&, const IntrusivePtr<ModelElement::Impl>& element) { all.push_back(element); });
  // Everything that could refer to an element dies with it: no incoming index needs
  // keeping, and unlinking entry by entry would cost quadratic time on a target that
  // many elements refer to.
  for (auto& element : all) element->incoming_.clear();
  for (auto& [id, proxy] : proxies_) proxy->incoming_.clear();
  for (auto& element : all) element->invalidate();
  for (auto& element : all) element->basicDetachFromModel();
  for (auto& [id, proxy] : proxies_) proxy->model_ = nullptr;
  for (auto& holder : listeners_) holder->getListener()->listenerRemoved();
}

// ---- elements ---------------------------------------------------------------

ModelElement ModelImpl::findElement(const Uuid& id, FindElementBehavior behavior) const {
  if (const auto* element = elements_.find(id)) return ModelElement(*element);
  if (behavior == FindElementBehavior::IncludeProxies) {
    if (auto it = proxies_.find(id); it != proxies_.end()) return ModelElement(it->second);
  }
  return ModelElement();
}

std::vector<ModelElement> ModelImpl::getTopLevelElements() const {
  std::vector<ModelElement> result;
  result.reserve(topLevel_.size());
  for (const auto& [serial, element] : topLevel_) result.emplace_back(element);
  return result;
}

std::vector<ModelElement> ModelImpl::getInstances(const meta::Class& metaClass,
                                                  query::SearchClassMatchMode mode) const {
  std::map<std::uint64_t, ModelElement::Impl*> merged;
  for (const auto& [classImpl, members] : instances_) {
    if (members.empty()) continue;
    const meta::Class candidate = members.begin()->second->getMetaClass();
    const bool match = mode == query::SearchClassMatchMode::ExactClass ? candidate == metaClass
                                                                       : candidate->isSubclassOf(metaClass);
    if (match) merged.insert(members.begin(), members.end());
  }
  std::vector<ModelElement> result;
  result.reserve(merged.size());
  for (const auto& [serial, element] : merged) result.emplace_back(element);
  return result;
}

void ModelImpl::registerElement(ModelElement::Impl* element) {
  // An element a cancel brings back takes its UUID over from one created since with the
  // same UUID, which the same cancel removes.
  elements_.insertOrAssign(element->uuid_, IntrusivePtr<ModelElement::Impl>(element));
  indexElement(element);
}

namespace {

// Serials grow, so a new element goes last: the hint spares the walk down the tree.
void insertBySerial(std::map<std::uint64_t, ModelElement::Impl*>& bySerial, std::uint64_t serial,
                    ModelElement::Impl* element) {
  if (bySerial.empty() || bySerial.rbegin()->first < serial) {
    bySerial.emplace_hint(bySerial.end(), serial, element);
  } else {
    bySerial.emplace(serial, element);
  }
}

void eraseBySerial(std::map<std::uint64_t, ModelElement::Impl*>& bySerial, std::uint64_t serial) {
  if (!bySerial.empty() && bySerial.rbegin()->first == serial) {
    bySerial.erase(std::prev(bySerial.end()));
  } else {
    bySerial.erase(serial);
  }
}

}  // namespace

void ModelImpl::indexElement(ModelElement::Impl* element) {
  if (!proxies_.empty() && proxies_.erase(element->uuid_) != 0) element->tookOverProxy_ = true;
  insertBySerial(instances_[element->getMetaClass().getImpl()], element->serial_, element);
  updateTopLevel(element);
}

void ModelImpl::unregisterElement(ModelElement::Impl* element) noexcept {
  eraseBySerial(topLevel_, element->serial_);
  if (auto it = instances_.find(element->getMetaClass().getImpl()); it != instances_.end()) {
    eraseBySerial(it->second, element->serial_);
  }
  // Only its own entry: the UUID may already name an element a cancel brought back.
  // Erasing may drop the last reference: keep it last.
  if (const auto* entry = elements_.find(element->uuid_); entry != nullptr && entry->get() == element) {
    elements_.erase(element->uuid_);
  }
}

void ModelImpl::updateTopLevel(ModelElement::Impl* element) noexcept {
  if (element->isTopLevel()) {
    insertBySerial(topLevel_, element->serial_, element);
  } else {
    eraseBySerial(topLevel_, element->serial_);
  }
}

ModelElement ModelImpl::resolveProxy(const ModelElement::Impl* from, const ModelElement& proxy) {
  if (ModelElement resident = peekResolveProxy(from, proxy); resident) return resident;
  if (proxy && proxyLoader_) {
    if (ModelElement loaded = proxyLoader_(*this, proxy->getProxyId()); loaded && !loaded.isProxy())
      return loaded;
  }
  reportException(qf0::messages::CannotResolveProxy(proxy ? toText(proxy->getUuid()) : std::string()));
}

ModelElement ModelImpl::peekResolveProxy(const ModelElement::Impl*, const ModelElement& proxy) const {
  if (!proxy || !proxy.isProxy()) return proxy;
  return findElement(proxy->getUuid());
}

// ---- listeners --------------------------------------------------------------

ListenerHolderBase* ModelImpl::addListenerHolder(std::shared_ptr<ListenerHolderBase> holder) {
  listeners_.push_back(std::move(holder));
  return listeners_.back().get();
}

void ModelImpl::removeListenerIf(const std::function<bool(const ListenerHolderBase&)>& predicate) {
  std::vector<std::shared_ptr<ListenerHolderBase>> removed;
  std::erase_if(listeners_, [&](const std::shared_ptr<ListenerHolderBase>& holder) {
    if (!predicate(*holder)) return false;
    holder->detach();
    removed.push_back(holder);
    return true;
  });
  for (auto& holder : removed) holder->getListener()->listenerRemoved();
}

void ModelImpl::removeListenerFromTransaction(ListenerHolderBase* holder) { holder->detach(); }

template <class Callback>
void ModelImpl::forEachListener(const std::vector<std::shared_ptr<ListenerHolderBase>>& holders,
                                Callback callback) {
  for (const auto& holder : holders) {
    if (!holder->isDetached()) callback(*holder);
  }
}

// ---- transactions -------------------------------------------------------------

Transaction ModelImpl::beginTransaction(bool savepoint) {
  if (!txn_) {
    txn_ = std::make_unique<TransactionState>();
    txn_->levels.emplace_back();
    txn_->openCount = 1;
    return Transaction(this, 0);
  }
  ++txn_->openCount;
  if (!savepoint) return Transaction(this, -1, txn_->changeCount);
  txn_->levels.emplace_back();
  return Transaction(this, txn_->currentLevel());
}

ElementRecord& ModelImpl::recordFor(ModelElement::Impl* element) {
  if (element->record_ == nullptr) {
    ElementRecord& record = txn_->records.emplace_back();
    record.element = IntrusivePtr<ModelElement::Impl>(element);
    element->record_ = &record;
  }
  return *element->record_;
}

void ModelImpl::commitLevel(int level, boost::optional<Value> result) {
  if (level < 0) {
    --txn_->openCount;
    return;
  }
  if (level == 0) {
    commitOutermost(std::move(result));
    return;
  }
  TransactionState& state = *txn_;
  if (state.levels.back().aborted) {
    cancelLevel(level);
    reportException(qf0::messages::TransactionAborted());
  }
  const int outer = level - 1;
  for (ElementRecord* record : state.levels.back().records) {
    if (record->dead) continue;
    if (record->createdLevel == level) record->createdLevel = outer;
    if (record->destroyedLevel == level) record->destroyedLevel = outer;
    if (!record->storages.empty() && record->storages.back().level == level) {
      auto& storages = record->storages;
      if (record->createdLevel == outer) {
        storages.pop_back();  // nothing to restore in an element the outer level made
      } else if (storages.size() >= 2 && storages[storages.size() - 2].level == outer) {
        storages.back().storage->mergeInto(*storages[storages.size() - 2].storage);
        storages.pop_back();
      } else {
        storages.back().level = outer;
      }
    }
    record->listedLevels.pop_back();
    if (record->listedLevels.empty() || record->listedLevels.back() != outer) {
      record->listedLevels.push_back(outer);
      state.levels[outer].records.push_back(record);
    }
  }
  state.levels.pop_back();
  --state.openCount;
}

void ModelImpl::cancelLevel(int level) noexcept {
  TransactionState& state = *txn_;
  if (level < 0) {
    // A joined operation failed: what it changed cannot be told apart from the rest
    // of the innermost level, so that level can only be cancelled as a whole.
    state.levels.back().aborted = true;
    --state.openCount;
    return;
  }
  if (level == 0) {
    std::shared_ptr<ReportData> report;
    auto holders = listeners_;
    const bool anyObserver =
        std::any_of(holders.begin(), holders.end(), [](const auto& h) { return h->observesCancels(); });
    if (anyObserver) {
      try {
        report = buildReport(true, boost::none);
      } catch (...) {
        report.reset();
      }
    }
    rollbackLevel(0);
    closeTransaction();
    if (report) {
      forEachListener(holders, [&](ListenerHolderBase& holder) {
        try {
          holder.transactionCanceled(false, report);
        } catch (...) {  // a cancel cannot fail; a listener's fault must not hide that
        }
      });
    }
    return;
  }
  rollbackLevel(level);
  state.levels.pop_back();
  --state.openCount;
}

void ModelImpl::rollbackLevel(int level) noexcept {
  TransactionState& state = *txn_;
  auto& records = state.levels[level].records;
  // Undoing a change to a watched element changes it too: whatever was derived from it in
  // between is stale. An element made at this level only vanishes: what was derived from it
  // alone belongs to it, and an element that came to point at it changed at this level too;
  // unless a proxy resolved to it, which points at it without a change.
  const auto onlyVanishes = [&](const ElementRecord& record) {
    const ModelElement::Impl& element = *record.element;
    return record.createdLevel == level && !element.tookOverProxy_ && proxies_.count(element.uuid_) == 0;
  };
  for (const ElementRecord* record : records) {
    if (!record->dead && record->element->isWatched() && !onlyVanishes(*record)) {
      ++watchedChanges_;
      break;
    }
  }
  for (auto it = records.rbegin(); it != records.rend(); ++it) {
    ElementRecord& record = **it;
    if (!record.dead && record.destroyedLevel == level) {
      ModelElement::Impl* element = record.element.get();
      element->state_ = ModelElement::Impl::State::Live;
      registerElement(element);
      record.destroyedLevel = -1;
    }
  }
  for (bool collections : {false, true}) {
    for (auto it = records.rbegin(); it != records.rend(); ++it) {
      ElementRecord& record = **it;
      if (record.dead) continue;
      if (auto* storage = record.storageAt(level)) record.element->restoreFromStorage(storage, collections);
    }
  }
  for (auto it = records.rbegin(); it != records.rend(); ++it) {
    ElementRecord& record = **it;
    if (record.dead || record.createdLevel != level) continue;
    ModelElement::Impl* element = record.element.get();
    element->invalidate();
    element->state_ = ModelElement::Impl::State::Destroyed;
    unregisterElement(element);
    record.createdLevel = -1;
  }
  for (ElementRecord* record : records) {
    if (record->dead) continue;
    if (record->storageAt(level) != nullptr) record->storages.pop_back();
    if (!record->listedLevels.empty() && record->listedLevels.back() == level)
      record->listedLevels.pop_back();
    if (record->element->isLive()) updateTopLevel(record->element.get());
    if (record->isEmpty() && record->listedLevels.empty()) {
      record->dead = true;
      record->element->record_ = nullptr;
    }
  }
}

std::shared_ptr<ReportData> ModelImpl::buildReport(bool deep, const boost::optional<Value>& result) {
  std::vector<ReportData::Entry> entries;
  for (ElementRecord& record : txn_->records) {
    if (record.dead) continue;
    const bool created = record.createdLevel == 0;
    const bool destroyed = record.destroyedLevel == 0;
    if (created && destroyed) continue;
    ModelElement element(record.element);
    if (created) {
      entries.push_back({element, ReportData::Kind::Added, nullptr});
      continue;
    }
    auto storage = record.storages.empty() ? nullptr : record.storages.front().storage;
    if (destroyed) {
      if (storage) storage->materialize(record.element.get());
      entries.push_back({element, ReportData::Kind::Destroyed, storage});
      continue;
    }
    if (!storage) continue;
    storage->revertUnchanged(record.element.get());
    if (storage->anyChanged()) entries.push_back({element, ReportData::Kind::Modified, storage});
  }
  Model model(this);
  if (deep) return std::make_shared<DeepChangeReport<ModelElement>>(model, std::move(entries), result);
  return std::make_shared<ShallowChangeReport<ModelElement>>(model, std::move(entries), result);
}

std::shared_ptr<ReportData> ModelImpl::validateOutermost(
    const std::vector<std::shared_ptr<ListenerHolderBase>>& holders, const boost::optional<Value>& result) {
  TransactionState& state = *txn_;
  const bool deep = std::any_of(holders.begin(), holders.end(), [](const auto& h) { return h->isDeep(); });
  std::shared_ptr<ReportData> report;
  try {
    if (!holders.empty()) {
      state.phase = TransactionState::Phase::Validating;
      report = buildReport(deep, result);
      forEachListener(holders, [&](ListenerHolderBase& h) {
        if (h.validates()) h.validateOnCommit(report);
      });
      state.phase = TransactionState::Phase::Modifying;
      bool modifies = false;
      forEachListener(holders, [&](ListenerHolderBase& h) {
        if (!h.modifies()) return;
        modifies = true;
        h.modifyOnCommit(report);
      });
      if (modifies) report = buildReport(deep, result);
    }
  } catch (...) {
    std::shared_ptr<ReportData> canceled = report;
    rollbackLevel(0);
    closeTransaction();
    if (canceled) {
      forEachListener(holders, [&](ListenerHolderBase& h) {
        if (!h.observesCancels()) return;
        try {
          h.transactionCanceled(true, canceled);
        } catch (...) {  // the veto is what the committer must see
        }
      });
    }
    throw;
  }
  return report;
}

std::vector<std::shared_ptr<ListenerHolderBase>> ModelImpl::listenersForClosing() {
  if (txn_->levels.back().aborted) {
    cancelLevel(0);
    reportException(qf0::messages::TransactionAborted());
  }
  auto holders = listeners_;
  for (auto& holder : holders) holder->reattach();
  return holders;
}

void ModelImpl::prepareOutermost() {
  TransactionState& state = *txn_;
  const auto holders = listenersForClosing();
  state.preparedReport = validateOutermost(holders, boost::none);
  state.phase = TransactionState::Phase::Open;
  state.preparedAt = state.changeCount;
  state.prepared = true;
}

void ModelImpl::commitOutermost(boost::optional<Value> result) {
  TransactionState& state = *txn_;
  const auto holders = listenersForClosing();
  const bool stillPrepared = state.prepared && state.preparedAt == state.changeCount && !result;
  const std::shared_ptr<ReportData> report =
      stillPrepared ? state.preparedReport : validateOutermost(holders, result);

  state.phase = TransactionState::Phase::Closing;
  for (ElementRecord& record : state.records) {
    if (!record.dead && record.destroyedLevel == 0) record.element->invalidate();
  }
  closeTransaction();

  std::exception_ptr firstFailure;
  forEachListener(holders, [&](ListenerHolderBase& h) {
    if (!h.observesCommits()) return;
    try {
      h.transactionCommitted(report);
    } catch (...) {
      if (!firstFailure) firstFailure = std::current_exception();
    }
  });
  if (firstFailure) std::rethrow_exception(firstFailure);
}

void ModelImpl::closeTransaction() noexcept {
  std::unique_ptr<TransactionState> state = std::move(txn_);
  for (ElementRecord& record : state->records) {
    if (record.element->record_ == &record) record.element->record_ = nullptr;
  }
}

}  // namespace qf::zero
