// ModelImpl (Model::Impl): the elements of a model, its transactions and listeners.
//
// A model is used by one thread at a time; nothing here locks. Live elements are
// owned by the model; destroyed ones stay valid as long as handles refer to them.
#pragma once

#include "qf/zero/core/internal/element_impl.h"
#include "qf/zero/core/internal/flat_table.h"
#include "qf/zero/core/listener.h"
#include "qf/zero/core/model.h"
#include "qf/zero/core/query.h"
#include "qf/zero/core/transaction.h"

#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <string>
#include <unordered_map>
#include <vector>

namespace qf::zero {

enum class FindElementBehavior {
  LiveOnly,       // resident, live elements
  IncludeProxies  // also a proxy the model made for the UUID
};

// Opens transactions on one model; what the library uses on a user model.
class TransactionFactory {
 public:
  explicit TransactionFactory(Model model) : model_(std::move(model)) {}
  Transaction beginTransaction(bool savepoint = true) const;
  const Model& getModel() const noexcept { return model_; }

 private:
  Model model_;
};

// A model's elements, transactions and listeners. Used by one thread at a time: nothing here
// locks.
class ModelImpl final : public RefCounted {
 public:
  ModelImpl(const Uuid& id, ModelConstellation constellation);
  ~ModelImpl() override;

  const Uuid& getUuid() const noexcept { return uuid_; }
  ModelConstellation getConstellation() const noexcept { return constellation_; }
  // The URI other models use in proxy ids; empty unless set.
  const std::u16string& getUri() const noexcept { return uri_; }
  void setUri(std::u16string uri) { uri_ = std::move(uri); }

  // Transactions. `savepoint` decides what a begin inside an open transaction does:
  // true opens a savepoint (its cancel undoes only its changes); false just joins, for
  // operations that check everything before they change anything. When nothing is
  // open, both open the outermost transaction.
  Transaction beginTransaction(bool savepoint = true);
  bool isInTransaction() const noexcept { return txn_ != nullptr; }
  TransactionFactory getDefaultTransactionFactory();

  // Elements.
  ModelElement findElement(const Uuid& id,
                           FindElementBehavior behavior = FindElementBehavior::LiveOnly) const;
  // Live elements without a container, in creation order.
  std::vector<ModelElement> getTopLevelElements() const;
  std::size_t getElementCount() const noexcept { return elements_.size(); }
  // Live instances of `metaClass` (and of its subclasses on request), in creation order.
  std::vector<ModelElement> getInstances(const meta::Class& metaClass,
                                         query::SearchClassMatchMode mode) const;

  // Changes to watched elements so far (see ModelElement::Impl::setWatched): data derived
  // from watched elements is stale once this count moves.
  std::uint64_t getWatchedChangeCount() const noexcept { return watchedChanges_; }

  // Data a library derives from this model and keeps beside it (caches, indexes): one
  // object per key, made on first request, dropped with the model. The framework never
  // reads it. A cache that must stay exact watches the elements it was built from.
  std::shared_ptr<void>& attachment(const void* key) { return attachments_[key]; }
  // The attachment under `key`, or null; never makes one, so that a thread that only looks
  // does not write to the model.
  std::shared_ptr<void> findAttachment(const void* key) const {
    const auto found = attachments_.find(key);
    return found == attachments_.end() ? nullptr : found->second;
  }

  // Proxies. resolveProxy returns the resident element for a proxy, loading it through
  // the proxy loader when one is set; raises "CannotResolveProxy" when neither works.
  // peekResolveProxy never loads and returns a null handle instead of raising. Both
  // return a resident element unchanged.
  using ProxyLoader = std::function<ModelElement(ModelImpl& model, const ProxyId& id)>;
  void setProxyLoader(ProxyLoader loader) { proxyLoader_ = std::move(loader); }
  ModelElement resolveProxy(const ModelElement::Impl* from, const ModelElement& proxy);
  ModelElement peekResolveProxy(const ModelElement::Impl* from, const ModelElement& proxy) const;

  // Listeners. The model does not own them; remove a listener before it dies.
  template <class T>
  ListenerHolderBase* addShallowListener(T* listener) {
    return addListenerHolder(std::make_shared<ListenerHolder<T, false>>(listener));
  }
  template <class T>
  ListenerHolderBase* addDeepListener(T* listener) {
    return addListenerHolder(std::make_shared<ListenerHolder<T, true>>(listener));
  }
  template <class T>
  void removeListener(T* listener) {
    const Listener* target = listener;
    removeListenerIf([target](const ListenerHolderBase& holder) { return holder.getListener() == target; });
  }
  void removeListenerIf(const std::function<bool(const ListenerHolderBase&)>& predicate);
  // Stops callbacks to `holder` for the transaction being committed; it stays registered.
  void removeListenerFromTransaction(ListenerHolderBase* holder);
  std::size_t getListenerCount() const noexcept { return listeners_.size(); }

  bool isFrozen() const noexcept { return freezeCount_ > 0 && thawCount_ == 0; }

 private:
  friend class Transaction;
  friend class Model::Freezer;
  friend class Model::Thawer;
  friend class ModelElement::Impl;
  friend struct internal::TransactionState;

  ListenerHolderBase* addListenerHolder(std::shared_ptr<ListenerHolderBase> holder);

  // Transaction ends, called by Transaction.
  void commitLevel(int level, boost::optional<Value> result);
  void cancelLevel(int level) noexcept;
  void commitOutermost(boost::optional<Value> result);
  void prepareOutermost();
  // The listeners that see the outermost transaction close; raises "TransactionAborted"
  // (after cancelling) when a joined operation failed inside it.
  std::vector<std::shared_ptr<ListenerHolderBase>> listenersForClosing();
  // Runs validateOnCommit and modifyOnCommit and returns the report they saw; a failure
  // rolls the transaction back, closes it, tells the cancel observers and is rethrown.
  std::shared_ptr<ReportData> validateOutermost(
      const std::vector<std::shared_ptr<ListenerHolderBase>>& holders, const boost::optional<Value>& result);
  void rollbackLevel(int level) noexcept;
  std::shared_ptr<ReportData> buildReport(bool deep, const boost::optional<Value>& result);
  void closeTransaction() noexcept;
  template <class Callback>
  void forEachListener(const std::vector<std::shared_ptr<ListenerHolderBase>>& holders, Callback callback);

  // Element bookkeeping, called by ModelElement::Impl and rollback.
  void registerElement(ModelElement::Impl* element);
  // The rest of registerElement, for an element already entered in elements_.
  void indexElement(ModelElement::Impl* element);
  void unregisterElement(ModelElement::Impl* element) noexcept;
  void updateTopLevel(ModelElement::Impl* element) noexcept;
  internal::ElementRecord& recordFor(ModelElement::Impl* element);

  Uuid uuid_;
  ModelConstellation constellation_;
  std::u16string uri_;
  internal::FlatTable<Uuid, IntrusivePtr<ModelElement::Impl>> elements_;
  std::map<std::uint64_t, ModelElement::Impl*> topLevel_;
  std::unordered_map<const void*, std::map<std::uint64_t, ModelElement::Impl*>> instances_;
  // Proxies made for elements not resident here; dropped once the element arrives.
  std::unordered_map<Uuid, IntrusivePtr<ModelElement::Impl>, qf::zero::internal::KeyedUuidHash> proxies_;
  std::uint64_t nextSerial_ = 1;
  std::uint64_t watchedChanges_ = 0;
  std::unordered_map<const void*, std::shared_ptr<void>> attachments_;
  std::unique_ptr<internal::TransactionState> txn_;
  std::vector<std::shared_ptr<ListenerHolderBase>> listeners_;
  ProxyLoader proxyLoader_;
  int freezeCount_ = 0;
  int thawCount_ = 0;
};

}  // namespace qf::zero
