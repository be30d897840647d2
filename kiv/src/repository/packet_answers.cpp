#include "kiv/repository/packet_answers.h"

#include "kiv/messages/messages.h"
#include "kiv/metamodel/branch_impl.h"
#include "kiv/metamodel/commit_impl.h"
#include "kiv/metamodel/local_repository_impl.h"
#include "qf/zero/core/model_impl.h"
#include "qf/zero/core/query.h"
#include "qf/zero/core/report_exception.h"
#include "qf/zero/core/text.h"
#include "qf/zero/core/transaction.h"
#include "qf/zero/io/json_constants.h"
#include "qf/zero/io/packet_codec.h"
#include "repository/history_branches.h"

#include <nlohmann/json.hpp>

namespace kiv {

namespace {

bool isPresent(const qf::zero::ModelElement& element) { return element && element.isLive(); }

qf::zero::Uuid identityOf(const qf::zero::ModelElement& element) {
  return element.isProxy() ? element->getProxyId().elementId : element.getUuid();
}

using protocol::PacketType;
using qf::zero::io::PacketCodec;

qf::zero::io::JSONPacket reply(PacketType type, qf::zero::JsonValue body = nullptr) {
  return qf::zero::io::JSONPacket(Repository::Impl::toString(type), std::move(body));
}

// A pull names the asker's branch states and nothing else: a document carrying commits,
// deltas, storages or anything else is not a pull request. Documents the parser refuses
// anyway (not an object, no entry array, entries of wrong JSON types) are left to it.
void requireBranchStatesOnly(const qf::zero::JsonValue& document) {
  using qf::zero::io::JSONConstants;
  if (!document.is_object()) return;
  const auto entries = document.find(JSONConstants::ENTRIES_ATTR);
  if (entries == document.end() || !entries->is_array()) return;
  static const std::string history = qf::zero::toUtf8(protocol::History::metaClass().getQualifiedName());
  static const std::string branch = qf::zero::toUtf8(Branch::metaClass().getQualifiedName());
  for (const qf::zero::JsonValue& entry : *entries) {
    if (!entry.is_object()) continue;
    const auto type = entry.find(JSONConstants::TYPE_ATTR);
    if (type == entry.end() || !type->is_string()) continue;
    const std::string& name = type->get_ref<const std::string&>();
    if (name != history && name != branch) {
      qf::zero::reportException(messages::MalformedHistory("a pull request names branch states only, not " +
                                                           PacketCodec::quotable(name)));
    }
  }
}

}  // namespace

void requireNullBody(const qf::zero::io::JSONPacket& request) {
  if (!request.getJson().is_null()) {
    qf::zero::reportException(qf0::messages::MalformedPacket(
        "a \"" + PacketCodec::quotable(request.getType()) + "\" request carries null"));
  }
}

qf::zero::io::JSONPacket answerPullInfo(const LocalRepository& self) {
  const Branch head = self->getHead();
  qf::zero::JsonValue info = qf::zero::JsonValue::object();
  info["isBare"] = self->getIsBare();
  info["head"] = isPresent(head) ? qf::zero::toUtf8(head->getName()) : std::string();
  return reply(PacketType::RepoInfo, std::move(info));
}

// The asker sends its branch states; the reply carries them as the previous states, this
// repository's branches as the current ones, and the commits between. The branches that
// stand for the asker's are made in a transaction that is then cancelled: answering a
// pull leaves the repository model as it was.
qf::zero::io::JSONPacket answerPull(const LocalRepository& self, const qf::zero::io::JSONPacket& request) {
  requireBranchStatesOnly(request.getJson());
  const qf::zero::Model asked = qf::zero::Model::create();
  const protocol::History theirs = protocol::History::unpackBranches(request.getJson(), asked);
  const qf::zero::Model& model = self.getModel();
  qf::zero::Transaction transaction = model->beginTransaction();
  const protocol::History answer = protocol::History::create(model);
  for (const Branch& branch : repository::branchesOf(theirs, true)) {
    if (!isPresent(branch)) continue;
    const Branch state = Branch::create(model);
    state->setName(branch->getName());
    const Commit tip = branch->getTip();
    const qf::zero::ModelElement known = tip ? model->findElement(identityOf(tip)) : qf::zero::ModelElement();
    if (isPresent(known) && known.getMetaClass() == Commit::metaClass()) {
      state->setTip(qf::zero::elementCast<Commit>(known));
    }
    repository::addBranch(answer, true, state);
  }
  for (const auto& [name, branch] : self->getBranches().container()) {
    if (isPresent(branch)) repository::addBranch(answer, false, branch);
  }
  qf::zero::JsonValue document = answer.pack();
  transaction.cancel();
  return reply(PacketType::History, std::move(document));
}

namespace {

protocol::History receivedHistoryIn(const qf::zero::Model& model) {
  qf::zero::query::AbstractQuery query(model);
  for (const protocol::History& history : protocol::History::Constrainables(query).getTypedInstances()) {
    return history;
  }
  qf::zero::reportException(messages::MalformedHistory("no history entry"));
}

}  // namespace

// Accepted only when the pusher saw this repository as it is ("CannotPush" otherwise);
// then the pushed branches are taken over, all in one transaction.
qf::zero::io::JSONPacket answerPush(const LocalRepository& self, const qf::zero::io::JSONPacket& request) {
  qf::zero::Transaction transaction = self.getModel()->beginTransaction();
  const Repository pushed = self->unpackHistory(request.getJson());
  if (!self->canPush(receivedHistoryIn(pushed.getModel()))) {
    transaction.cancel();
    self->lastUnpackedModel_ = qf::zero::Model();
    return reply(PacketType::CannotPush);
  }
  self->syncBranches(pushed);
  transaction.commit();
  self->lastUnpackedModel_ = qf::zero::Model();  // the scratch history has served
  return reply(PacketType::OK);
}

qf::zero::io::JSONPacket answerObserver(const LocalRepository& self, bool adding) {
  {
    qf::zero::Transaction transaction = self.getModel()->beginTransaction();
    const int count = self->getNumRemoteObservers();
    if (adding) {
      self->setNumRemoteObservers(count + 1);
    } else if (count > 0) {
      self->setNumRemoteObservers(count - 1);
    }
    transaction.commit();
  }
  if (adding && !self->getRepositoryListener()) self->addRepositoryListener();
  if (!adding) self->removeRepositoryListener();
  return reply(PacketType::OK);
}

}  // namespace kiv
