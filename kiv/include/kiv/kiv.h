// kiv: version control for in-memory object models.
//
// This header gives the whole public API: kiv's element classes (generated from
// kiv/metamodel/kiv_metamodel.json into <build>/kiv/generated/include/kiv/metamodel/),
// its message catalog, the merge strategies and tools, and the parts of the qf::zero framework
// every caller needs (models, transactions, elements, values). Each class documents its
// contract in its own header; an operation that raises leaves its model as it was.
//
// History is kept as elements of a model of its own, separate from the user's model:
//
//   #include "kiv/kiv.h"
//
//   kiv::MetaPackageKiv::getInstance();                // builds and registers kiv's metamodel
//   qf::zero::Model history = qf::zero::Model::create();
//   qf::zero::Transaction transaction = history->beginTransaction();
//   kiv::Commit first = kiv::Commit::create(history);
//   first->addCreated(book);                          // book: an element of the user's model
//   kiv::Branch master = kiv::Branch::create(history);
//   master->setName(u"master");
//   master->commit(first);
//   transaction.commit();
//
//   kiv::Delta back = master->undo();                 // the change that undoes `first`
//   qf::zero::io::JSONChangeReportSynchronizer::applyChangeReportVerbatim(
//       back->toChangeReport(), book.getModel(), std::make_unique<kiv::ElementReuseModelBuilder>());
//   // book is gone from the user's model; master->redo() returns the delta that redoes it.
//
// Headers under an `internal/` folder are the library's own: never include them.
#pragma once

#include "kiv/history/element_reuse_model_builder.h"
#include "kiv/merge/accept_theirs_merge_strategy.h"
#include "kiv/merge/accept_theirs_merge_tool.h"
#include "kiv/merge/default_merge_strategy.h"
#include "kiv/merge/merge3_strategy.h"
#include "kiv/merge/merge_strategy.h"
#include "kiv/merge/merge_tool.h"
#include "kiv/merge/property_merge_tool.h"
#include "kiv/merge/recursive_merge3_strategy.h"
#include "kiv/messages/messages.h"
#include "kiv/metamodel/branch_impl.h"
#include "kiv/metamodel/commit_impl.h"
#include "kiv/metamodel/delta_impl.h"
#include "kiv/metamodel/dependency_impl.h"
#include "kiv/metamodel/local_repository_impl.h"
#include "kiv/metamodel/meta_package_kiv.h"
#include "kiv/metamodel/object_storage_impl.h"
#include "kiv/metamodel/protocol/history_impl.h"
#include "kiv/metamodel/remote_repository_impl.h"
#include "kiv/metamodel/repository_impl.h"
#include "kiv/metamodel/workspace_impl.h"
#include "kiv/repository/aggregate_model_traverser.h"
#include "kiv/repository/notice_executor.h"
#include "kiv/repository/repository_listener.h"
#include "kiv/workspace/commit_producer.h"
#include "kiv/workspace/load_context.h"
#include "qf/zero/core/model_element.h"
#include "qf/zero/core/model_impl.h"
#include "qf/zero/core/transaction.h"
#include "qf/zero/core/value.h"
#include "qf/zero/io/json_change_report_synchronizer.h"
