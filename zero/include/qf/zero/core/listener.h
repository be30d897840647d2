// Transaction listeners.
//
// A listener class derives from Listener and defines any of the four callbacks, each
// taking the report as a shared pointer:
//
//   struct Audit : qf::zero::Listener {
//     void transactionCommitted(const std::shared_ptr<qf::zero::ShallowChangeReport<qf::zero::ModelElement>>&
//     r);
//   };
//   model->addShallowListener(&audit);
//
// Order at commit: validateOnCommit (may throw to veto: the transaction is cancelled
// and the exception reaches the committer), modifyOnCommit (may still change the
// model), then, once the transaction is closed, transactionCommitted. A cancelled
// outermost transaction calls transactionCanceled(vetoed, report) instead.
#pragma once

#include "qf/zero/core/change_report.h"

#include <memory>
#include <type_traits>

namespace qf::zero {

// The base of transaction listeners: a model calls whichever of the four callbacks (see the
// top of listener.h) the derived class defines, found at compile time when it is registered.
class Listener {
 public:
  virtual ~Listener() = default;
  // Called once the listener no longer receives callbacks from a model (removed, or
  // the model is gone).
  virtual void listenerRemoved() {}
};

// How a model keeps a registered listener: whether it is deep and which callbacks it has,
// fixed at registration (ModelImpl::addShallowListener, addDeepListener).
class ListenerHolderBase {
 public:
  ListenerHolderBase(Listener* listener, bool deep, bool validates, bool modifies, bool observesCommits,
                     bool observesCancels)
      : listener_(listener),
        deep_(deep),
        validates_(validates),
        modifies_(modifies),
        observesCommits_(observesCommits),
        observesCancels_(observesCancels) {}
  virtual ~ListenerHolderBase() = default;

  Listener* getListener() const noexcept { return listener_; }
  bool isDeep() const noexcept { return deep_; }
  bool validates() const noexcept { return validates_; }
  bool modifies() const noexcept { return modifies_; }
  bool observesCommits() const noexcept { return observesCommits_; }
  bool observesCancels() const noexcept { return observesCancels_; }
  // A detached holder receives no further callback of the transaction in progress.
  bool isDetached() const noexcept { return detached_; }
  void detach() noexcept { detached_ = true; }
  void reattach() noexcept { detached_ = false; }

  // The report is a DeepChangeReport<ModelElement> for deep holders, a
  // ShallowChangeReport<ModelElement> otherwise.
  virtual void validateOnCommit(const std::shared_ptr<ReportData>& report) = 0;
  virtual void modifyOnCommit(const std::shared_ptr<ReportData>& report) = 0;
  virtual void transactionCommitted(const std::shared_ptr<ReportData>& report) = 0;
  virtual void transactionCanceled(bool vetoed, const std::shared_ptr<ReportData>& report) = 0;

 private:
  Listener* listener_;
  bool deep_;
  bool validates_;
  bool modifies_;
  bool observesCommits_;
  bool observesCancels_;
  bool detached_ = false;
};

// Calls the callbacks that T defines, with the report typed as a deep or a shallow one; the
// others cost nothing.
template <class T, bool Deep>
class ListenerHolder final : public ListenerHolderBase {
 public:
  using Report = std::conditional_t<Deep, DeepChangeReport<ModelElement>, ShallowChangeReport<ModelElement>>;
  using ReportPtr = std::shared_ptr<Report>;

  explicit ListenerHolder(T* listener)
      : ListenerHolderBase(listener, Deep, kValidates, kModifies, kObservesCommits, kObservesCancels),
        typed_(listener) {}

  void validateOnCommit(const std::shared_ptr<ReportData>& report) override {
    if constexpr (kValidates) typed_->validateOnCommit(cast(report));
  }
  void modifyOnCommit(const std::shared_ptr<ReportData>& report) override {
    if constexpr (kModifies) typed_->modifyOnCommit(cast(report));
  }
  void transactionCommitted(const std::shared_ptr<ReportData>& report) override {
    if constexpr (kObservesCommits) typed_->transactionCommitted(cast(report));
  }
  void transactionCanceled(bool vetoed, const std::shared_ptr<ReportData>& report) override {
    if constexpr (kObservesCancels) typed_->transactionCanceled(vetoed, cast(report));
  }

 private:
  static constexpr bool kValidates = requires(T & t, const ReportPtr& r) { t.validateOnCommit(r); };
  static constexpr bool kModifies = requires(T & t, const ReportPtr& r) { t.modifyOnCommit(r); };
  static constexpr bool kObservesCommits = requires(T & t, const ReportPtr& r) { t.transactionCommitted(r); };
  static constexpr bool kObservesCancels = requires(T & t, const ReportPtr& r) {
    t.transactionCanceled(true, r);
  };

  static ReportPtr cast(const std::shared_ptr<ReportData>& report) {
    return std::static_pointer_cast<Report>(report);
  }

  T* typed_;
};

}  // namespace qf::zero
