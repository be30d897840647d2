// Push, pull and the packet handlers of a local repository.
#include "kiv/merge/merge_strategy.h"
#include "kiv/messages/messages.h"
#include "kiv/metamodel/branch_impl.h"
#include "kiv/metamodel/local_repository_impl.h"
#include "kiv/repository/packet_answers.h"
#include "qf/zero/core/messages.h"
#include "qf/zero/core/model_impl.h"
#include "qf/zero/core/report_exception.h"
#include "qf/zero/core/transaction.h"
#include "qf/zero/io/packet_transport.h"
#include "repository/history_branches.h"
#include "repository/remote_exchange.h"

#include <nlohmann/json.hpp>

namespace kiv {

namespace {

bool isPresent(const qf::zero::ModelElement& element) { return element && element.isLive(); }

// An origin branch without a tip precedes everything: pushing onto it loses nothing.
bool precedes(const Branch& theirs, const Branch& mine) {
  return !isPresent(theirs->getTip()) || theirs->isPredecessorOf(mine);
}

Repository liveOrigin(const LocalRepository::Impl& repository) {
  const Repository origin = repository.getOrigin();
  if (!isPresent(origin)) qf::zero::reportException(messages::NoOrigin());
  return origin;
}

// The history of a push: the origin's branches as they are, and ours as they will be.
// Under "MergeFirst" a diverged branch of ours is merged with the origin's first.
protocol::History describePush(LocalRepository::Impl& repository, const Repository& origin, PushMode mode) {
  const LocalRepository self(&repository);
  const protocol::History history = protocol::History::create(repository.getModel());
  origin->syncCreated(self, [&](const Branch& mine) { repository::addBranch(history, false, mine); });
  origin->syncDeleted(self, [&](const Branch& theirs) { repository::addBranch(history, true, theirs); });
  origin->syncUpdated(self, [&](const Branch& theirs, const Branch& mine) {
    if (!precedes(theirs, mine)) {
      if (mode == PushMode::TryPush) qf::zero::reportException(messages::CannotPush());
      const std::shared_ptr<IMergeStrategy>& strategy = repository.getIMergeStrategy();
      if (!strategy) {
        qf::zero::reportException(qf0::messages::ElementRequired(u"kiv.LocalRepository.IMergeStrategy"));
      }
      mine->merge(theirs, *strategy);
    }
    repository::addBranch(history, true, theirs);
    repository::addBranch(history, false, mine);
  });
  return history;
}

// The origin takes the pushed branches over only if it is still in the state the history
// was made against. In process, the pushing repository itself holds the branches the
// history's current set names.
// A remote origin takes the history over the network; its proxy then mirrors what the
// remote took over.
void deliverPush(const LocalRepository& self, const Repository& origin, const protocol::History& history) {
  if (const RemoteRepository remote = asRemote(origin)) {
    remote.pushObjects(history);
    const std::unique_lock<std::mutex> lock = lockExchanges(remote);
    origin->syncBranches(self);
    return;
  }
  if (!origin->canPush(history)) qf::zero::reportException(messages::CannotPush());
  origin->syncBranches(self);
}

// Drops the history of a push; behind a remote origin under its exchange lock, since a
// change notice may be pulling into the same model meanwhile.
void dropPushed(const Repository& origin, const protocol::History& history) noexcept {
  try {
    if (const RemoteRepository remote = asRemote(origin)) {
      const std::unique_lock<std::mutex> lock = lockExchanges(remote);
      repository::dropHistory(history);
      return;
    }
  } catch (...) {
    return;  // no lock to take: the history stays behind, which loses nothing
  }
  repository::dropHistory(history);
}

}  // namespace

std::future<void> LocalRepository::Impl::push(PushMode mode) {
  const Repository origin = liveOrigin(*this);
  if (!origin->getIsBare()) qf::zero::reportException(messages::PushBare());
  if (const Branch head = origin->getHead(); isPresent(head) && !canCheckout(head->getName())) {
    qf::zero::reportException(messages::HeadDelete());
  }
  // The proxy of a remote origin is brought up to date first, so that "TryPush" refuses
  // and "MergeFirst" merges against the remote's present state, as with a local origin.
  if (const RemoteRepository remote = asRemote(origin)) remote.pullObjects();
  protocol::History history;
  {
    qf::zero::Transaction transaction = getModelImpl()->beginTransaction();
    history = describePush(*this, origin, mode);
    transaction.commit();
  }
  const LocalRepository self(this);
  return std::async(std::launch::async, [self, origin, history] {
    try {
      deliverPush(self, origin, history);
    } catch (...) {
      dropPushed(origin, history);
      throw;
    }
    dropPushed(origin, history);
  });
}

std::future<void> LocalRepository::Impl::pull() {
  const Repository origin = liveOrigin(*this);
  const LocalRepository self(this);
  return std::async(std::launch::async, [self, origin] {
    if (const RemoteRepository remote = asRemote(origin)) {
      remote.pullObjects();
      const std::unique_lock<std::mutex> lock = lockExchanges(remote);
      self->syncBranches(origin);
      return;
    }
    self->syncBranches(origin);
  });
}

// The handlers of a served repository. Each runs on the transport's worker thread, one
// packet at a time, so the repository model is never used by two of them at once; a
// handler that raises is answered "Error" by the transport, after its transaction rolled
// everything back.
void LocalRepository::Impl::setOnReceive() {
  const std::shared_ptr<qf::zero::io::PacketTransport>& transport = getPacketTransport();
  if (!transport) return;
  const LocalRepository self(this);
  using protocol::PacketType;
  const auto on = [&](PacketType type,
                      std::function<qf::zero::io::JSONPacket(const qf::zero::io::JSONPacket&)> answer) {
    transport->setPacketHandler(
        toString(type),
        [answer = std::move(answer)](const qf::zero::io::JSONPacket& request)
            -> boost::optional<qf::zero::io::JSONPacket> { return answer(request); },
        qf::zero::io::PacketPromiseMode::OnWorkerThread);
  };
  on(PacketType::PullInfo, [self](const qf::zero::io::JSONPacket& request) {
    requireNullBody(request);
    return answerPullInfo(self);
  });
  on(PacketType::Pull, [self](const qf::zero::io::JSONPacket& request) { return answerPull(self, request); });
  on(PacketType::Push, [self](const qf::zero::io::JSONPacket& request) { return answerPush(self, request); });
  on(PacketType::AddRemoteObserver, [self](const qf::zero::io::JSONPacket& request) {
    requireNullBody(request);
    return answerObserver(self, true);
  });
  on(PacketType::RemoveRemoteObserver, [self](const qf::zero::io::JSONPacket& request) {
    requireNullBody(request);
    return answerObserver(self, false);
  });
}

}  // namespace kiv
