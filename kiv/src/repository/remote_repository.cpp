#include "kiv/messages/messages.h"
#include "kiv/metamodel/branch_impl.h"
#include "kiv/metamodel/local_repository_impl.h"
#include "kiv/metamodel/remote_repository_impl.h"
#include "qf/zero/core/messages.h"
#include "qf/zero/core/model_impl.h"
#include "qf/zero/core/report_exception.h"
#include "qf/zero/core/text.h"
#include "qf/zero/core/transaction.h"
#include "qf/zero/io/packet_transport.h"
#include "repository/history_branches.h"
#include "repository/remote_exchange.h"

#include <nlohmann/json.hpp>

namespace kiv {

namespace {

using protocol::PacketType;
using qf::zero::io::JSONPacket;

bool isPresent(const qf::zero::ModelElement& element) { return element && element.isLive(); }

std::string textOf(PacketType type) { return Repository::Impl::toString(type); }

std::shared_ptr<qf::zero::io::PacketTransport> transportOf(const RemoteRepository::Impl& remote) {
  std::shared_ptr<qf::zero::io::PacketTransport> transport = remote.getPacketTransport();
  if (!transport)
    qf::zero::reportException(qf0::messages::ElementRequired(u"kiv.RemoteRepository.packetTransport"));
  return transport;
}

// Sends one request and returns the reply when it has the type awaited. A refused push
// reaches the pushing user as "CannotPush", as in process; any other reply (an "Error"
// included) is unexpected.
JSONPacket exchange(const RemoteRepository::Impl& remote, PacketType request, qf::zero::JsonValue body,
                    PacketType awaited) {
  const std::string awaitedText = textOf(awaited);
  JSONPacket reply =
      transportOf(remote)->sendAndExpectPacket(JSONPacket(textOf(request), std::move(body)), awaitedText);
  if (reply.getType() == awaitedText) return reply;
  if (request == PacketType::Push && reply.getType() == textOf(PacketType::CannotPush)) {
    qf::zero::reportException(messages::CannotPush());
  }
  qf::zero::reportException(messages::UnexpectedPacket("expecting OK"));
}

protocol::RepoInfo readRepoInfo(const qf::zero::JsonValue& body) {
  const auto bare = body.is_object() ? body.find("isBare") : body.end();
  const auto head = body.is_object() ? body.find("head") : body.end();
  if (bare == body.end() || !bare->is_boolean() || head == body.end() || !head->is_string()) {
    qf::zero::reportException(
        qf0::messages::MalformedPacket("a RepoInfo body is {\"isBare\": <boolean>, \"head\": <text>}"));
  }
  protocol::RepoInfo info;
  info.setIsBare(bare->get<bool>());
  info.setHead(qf::zero::toUtf16(head->get_ref<const std::string&>()));
  return info;
}

}  // namespace

RemoteRepository asRemote(const Repository& repository) {
  if (!isPresent(repository) || !repository.getMetaClass()->isSubclassOf(RemoteRepository::metaClass())) {
    return RemoteRepository();
  }
  return qf::zero::elementCast<RemoteRepository>(repository);
}

std::unique_lock<std::mutex> lockExchanges(const RemoteRepository& remote) {
  const std::shared_ptr<RemoteExchangeLock> lock = remote->exchangeLock_;
  if (!lock)
    qf::zero::reportException(qf0::messages::ElementRequired(u"kiv.RemoteRepository.packetTransport"));
  return std::unique_lock<std::mutex>(lock->mutex);
}

// Runs on its own thread; the caller leaves the proxy's model alone until the future is
// ready. The proxy takes the remote's bareness and head, so that the clone checks out
// the remote's head and may push into it exactly when the remote is bare.
std::future<LocalRepository> RemoteRepository::Impl::clone(RepoType repoType) {
  const RemoteRepository self(this);
  transportOf(*this);
  return std::async(std::launch::async, [self, repoType] {
    const protocol::RepoInfo info = self->pullRepoInfo();
    {
      std::unique_lock<std::mutex> lock = lockExchanges(self);
      qf::zero::Transaction transaction = self.getModel()->beginTransaction();
      self->setIsBare(info.getIsBare());
      transaction.commit();
    }
    self->pullObjects();
    std::unique_lock<std::mutex> lock = lockExchanges(self);
    qf::zero::Transaction transaction = self.getModel()->beginTransaction();
    const auto& branches = self->getBranches().container();
    const auto head = branches.find(info.getHead());
    self->setHead(head != branches.end() && isPresent(head->second) ? head->second : Branch());
    LocalRepository clone = LocalRepository::clone(self, repoType);
    transaction.commit();
    return clone;
  });
}

LocalRepository RemoteRepository::Impl::synchronousClone(RepoType repoType) { return clone(repoType).get(); }

void RemoteRepository::Impl::pushObjects(const protocol::History& history) {
  if (!isPresent(history))
    qf::zero::reportException(qf0::messages::ElementRequired(u"kiv.RemoteRepository.pushObjects"));
  const std::unique_lock<std::mutex> lock = lockExchanges(RemoteRepository(this));
  exchange(*this, PacketType::Push, history.pack(), PacketType::OK);
}

// Asks for what this proxy lacks, with its branches as both states, and takes the reply's
// branches over in one transaction of the proxy's model.
void RemoteRepository::Impl::pullObjects() {
  const std::unique_lock<std::mutex> lock = lockExchanges(RemoteRepository(this));
  protocol::History request;
  {
    qf::zero::Transaction transaction = getModelImpl()->beginTransaction();
    request = protocol::History::create(getModel());
    for (const auto& [name, branch] : getBranches().container()) {
      repository::addBranch(request, true, branch);
      repository::addBranch(request, false, branch);
    }
    transaction.commit();
  }
  try {
    JSONPacket reply = exchange(*this, PacketType::Pull, request.pack(), PacketType::History);
    qf::zero::Transaction transaction = getModelImpl()->beginTransaction();
    syncBranches(unpackHistory(reply.getJson()));
    transaction.commit();
    lastUnpackedModel_ = qf::zero::Model();  // the scratch history has served
  } catch (...) {
    repository::dropHistory(request);
    throw;
  }
  repository::dropHistory(request);
}

protocol::RepoInfo RemoteRepository::Impl::pullRepoInfo() {
  const std::unique_lock<std::mutex> lock = lockExchanges(RemoteRepository(this));
  return readRepoInfo(exchange(*this, PacketType::PullInfo, nullptr, PacketType::RepoInfo).getJson());
}

// Registered here first: a failed exchange leaves the local registration in place.
void RemoteRepository::Impl::addRepositoryObserver(const RepositoryObserver& observer) {
  Repository::Impl::addRepositoryObserver(observer);
  exchange(*this, PacketType::AddRemoteObserver, nullptr, PacketType::OK);
}

void RemoteRepository::Impl::removeRepositoryObserver(const RepositoryObserver& observer) {
  Repository::Impl::removeRepositoryObserver(observer);
  exchange(*this, PacketType::RemoveRemoteObserver, nullptr, PacketType::OK);
}

void RemoteRepository::Impl::load(const Dependency& /*history*/) {}

void RemoteRepository::Impl::requestPull(const Dependency& /*src*/) {}

// A change notice of the remote goes to this proxy's own observers, on the transport's
// worker thread, where a notified clone may pull through this same transport. Replies
// ("RepoInfo", "History", "OK") reach the exchange that waits for them before any
// handler; one that arrives unasked is dropped.
void RemoteRepository::Impl::setOnReceive() {
  if (!exchangeLock_) exchangeLock_ = std::make_shared<RemoteExchangeLock>();
  const std::shared_ptr<qf::zero::io::PacketTransport> transport = getPacketTransport();
  if (!transport) return;
  const RemoteRepository self(this);
  transport->setPacketHandler(
      textOf(PacketType::RepositoryModified),
      [self](const JSONPacket&) -> boost::optional<JSONPacket> {
        if (isPresent(self)) self->notifyObservers();
        return boost::none;
      },
      qf::zero::io::PacketPromiseMode::OnWorkerThread);
  for (const PacketType unasked : {PacketType::RepoInfo, PacketType::History, PacketType::OK}) {
    transport->setPacketHandler(textOf(unasked),
                                [](const JSONPacket&) -> boost::optional<JSONPacket> { return boost::none; });
  }
}

// A proxy observes nothing itself: the remote tells its own observers.
void RemoteRepository::Impl::repositoryModified(const Repository& /*src*/) {}

}  // namespace kiv
