#include "kiv/workspace/load_context.h"

#include "kiv/metamodel/commit_impl.h"
#include "kiv/metamodel/delta_impl.h"
#include "kiv/metamodel/workspace_impl.h"
#include "kiv/workspace/commit_producer.h"
#include "qf/zero/core/messages.h"
#include "qf/zero/core/model_impl.h"
#include "qf/zero/core/report_exception.h"
#include "qf/zero/core/transaction.h"

namespace kiv {

void loadContext(const Workspace& workspace) {
  if (!workspace || !workspace.isLive() || !workspace->getCommitProducer()) {
    qf::zero::reportException(qf0::messages::ElementRequired(u"kiv.loadContext"));
  }
  CommitProducer& producer = *workspace->getCommitProducer();
  qf::zero::Transaction transaction = workspace.getModel()->beginTransaction();
  CommitProducer::Rewrite rewrite(producer);
  const Commit context = workspace->getContext();
  if (context && context.isLive()) {
    Delta state = context->getSnapshot();
    rewrite.replaceState(state);
    state.destroy();
  } else {
    rewrite.clearModel();
  }
  // Prepared together: a veto of either transaction leaves both models as they were.
  rewrite.transaction().prepare();
  transaction.prepare();
  rewrite.transaction().commit();
  transaction.commit();
}

}  // namespace kiv
