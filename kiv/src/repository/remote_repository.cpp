#include "kiv/metamodel/remote_repository_impl.h"
#include "qf/zero/core/messages.h"
#include "qf/zero/core/report_exception.h"

namespace kiv {

std::future<kiv::LocalRepository> RemoteRepository::Impl::clone(::kiv::RepoType /*repoType*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.RemoteRepository.clone"));
}

void RemoteRepository::Impl::pushObjects(const ::kiv::protocol::History& /*history*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.RemoteRepository.pushObjects"));
}

void RemoteRepository::Impl::pullObjects() {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.RemoteRepository.pullObjects"));
}

::kiv::protocol::RepoInfo RemoteRepository::Impl::pullRepoInfo() {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.RemoteRepository.pullRepoInfo"));
}

::kiv::LocalRepository RemoteRepository::Impl::synchronousClone(::kiv::RepoType /*repoType*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.RemoteRepository.synchronousClone"));
}

void RemoteRepository::Impl::addRepositoryObserver(const ::kiv::RepositoryObserver& /*observer*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.RemoteRepository.addRepositoryObserver"));
}

void RemoteRepository::Impl::removeRepositoryObserver(const ::kiv::RepositoryObserver& /*observer*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.RemoteRepository.removeRepositoryObserver"));
}

void RemoteRepository::Impl::load(const ::kiv::Dependency& /*history*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.RemoteRepository.load"));
}

void RemoteRepository::Impl::requestPull(const ::kiv::Dependency& /*src*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.RemoteRepository.requestPull"));
}

void RemoteRepository::Impl::setOnReceive() {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.RemoteRepository.setOnReceive"));
}

void RemoteRepository::Impl::repositoryModified(const ::kiv::Repository& /*src*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.RemoteRepository.repositoryModified"));
}

}  // namespace kiv
