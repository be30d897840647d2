// Transaction: an RAII scope of changes to one model.
//
//   {
//     Transaction t = model->beginTransaction();
//     book.setPropertyValue(title, Value::of(std::u16string(u"Dune")));
//     t.commit();            // listeners run; without this line the change is undone
//   }
//
// A transaction begun while another is open on the same model is a savepoint of it:
// its commit merges its changes into the enclosing one (listeners run only when the
// outermost commits), its cancel undoes only its own changes. Transactions close in
// the reverse order they were begun.
#pragma once

#include "qf/zero/core/fwd.h"
#include "qf/zero/core/ref_counted.h"

#include <boost/optional.hpp>

#include <cstdint>

namespace qf::zero {

// A scope of changes to one model: commit() keeps them and runs the listeners, cancel() or
// leaving the scope undoes them. Move-only.
class Transaction {
 public:
  Transaction() noexcept = default;
  Transaction(Transaction&& other) noexcept;
  Transaction& operator=(Transaction&& other) noexcept;
  Transaction(const Transaction&) = delete;
  Transaction& operator=(const Transaction&) = delete;
  // Cancels the transaction when it is still open.
  ~Transaction();

  // Commits. For the outermost transaction the listeners' validateOnCommit and
  // modifyOnCommit run first; an exception from either cancels the whole transaction
  // and reaches the caller. `result` is handed to the listeners with the report.
  // Raises "TransactionNotOpen" when already closed.
  void commit();
  void commit(boost::optional<Value> result);
  // Runs the outermost transaction's validateOnCommit and modifyOnCommit now and keeps it
  // open: a commit without a result that follows with no change in between cannot be
  // vetoed any more. Two models are then changed together: prepare both, commit both. A
  // veto cancels the whole transaction, closes it and reaches the caller. No effect on a
  // savepoint or a joined transaction (the outermost one decides). Raises
  // "TransactionNotOpen" when closed.
  void prepare();
  // Undoes every change made since this transaction began. No effect when closed.
  void cancel() noexcept;
  bool isOpen() const noexcept { return open_; }
  // True for the transaction that began with no other open on its model.
  bool isOutermost() const noexcept { return open_ && level_ == 0; }

 private:
  friend class ModelImpl;
  Transaction(ModelImpl* model, int level, std::uint64_t changeMark = 0) noexcept;

  IntrusivePtr<ModelImpl> model_;
  int level_ = -1;                // savepoint level, or -1 when joined without one
  std::uint64_t changeMark_ = 0;  // the model's change count when a joined transaction began
  bool open_ = false;
};

}  // namespace qf::zero
