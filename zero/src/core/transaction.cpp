#include "qf/zero/core/transaction.h"

#include "core/transaction_state.h"
#include "qf/zero/core/messages.h"
#include "qf/zero/core/model_impl.h"
#include "qf/zero/core/report_exception.h"

namespace qf::zero {

Transaction::Transaction(ModelImpl* model, int level, std::uint64_t changeMark) noexcept
    : model_(model), level_(level), changeMark_(changeMark), open_(true) {}

Transaction::Transaction(Transaction&& other) noexcept
    : model_(std::move(other.model_)),
      level_(other.level_),
      changeMark_(other.changeMark_),
      open_(std::exchange(other.open_, false)) {}

Transaction& Transaction::operator=(Transaction&& other) noexcept {
  if (this != &other) {
    cancel();
    model_ = std::move(other.model_);
    level_ = other.level_;
    changeMark_ = other.changeMark_;
    open_ = std::exchange(other.open_, false);
  }
  return *this;
}

Transaction::~Transaction() { cancel(); }

void Transaction::commit() { commit(boost::none); }

void Transaction::commit(boost::optional<Value> result) {
  if (!open_ || !model_->txn_) reportException(qf0::messages::TransactionNotOpen());
  // Savepoints close innermost first; committing an outer one while an inner is
  // still open would leave the inner one nothing to close.
  if (level_ >= 0 && model_->txn_->currentLevel() != level_)
    reportException(qf0::messages::TransactionNotOpen());
  open_ = false;
  model_->commitLevel(level_, std::move(result));
}

void Transaction::prepare() {
  if (!open_ || !model_->txn_) reportException(qf0::messages::TransactionNotOpen());
  if (level_ != 0) return;
  if (model_->txn_->currentLevel() != 0) reportException(qf0::messages::TransactionNotOpen());
  try {
    model_->prepareOutermost();
  } catch (...) {
    open_ = false;
    throw;
  }
}

void Transaction::cancel() noexcept {
  if (!open_) return;
  open_ = false;
  if (!model_->txn_) return;
  if (level_ >= 0) {
    while (model_->txn_ && model_->txn_->currentLevel() > level_) {
      model_->cancelLevel(model_->txn_->currentLevel());
    }
    if (!model_->txn_) return;
  }
  if (level_ < 0 && model_->txn_->changeCount == changeMark_) {
    --model_->txn_->openCount;  // a joined operation that changed nothing
    return;
  }
  model_->cancelLevel(level_);
}

}  // namespace qf::zero
