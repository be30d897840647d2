#include "kiv/metamodel/local_repository_impl.h"
#include "qf/zero/core/messages.h"
#include "qf/zero/core/report_exception.h"

namespace kiv {

void LocalRepository::Impl::collectGarbage() {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.LocalRepository.collectGarbage"));
}

void LocalRepository::Impl::init(::kiv::RepoType /*repoType*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.LocalRepository.init"));
}

::kiv::LocalRepository LocalRepository::Impl::clone(::kiv::RepoType /*repoType*/) const {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.LocalRepository.clone"));
}

std::future<void> LocalRepository::Impl::push(::kiv::PushMode /*mode*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.LocalRepository.push"));
}

std::future<void> LocalRepository::Impl::pull() {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.LocalRepository.pull"));
}

void LocalRepository::Impl::tailChop(const ::kiv::Dependency& /*tail*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.LocalRepository.tailChop"));
}

::kiv::Workspace LocalRepository::Impl::getWorkspace(const qf::zero::Model& /*model*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.LocalRepository.getWorkspace"));
}

void LocalRepository::Impl::setDefaultMergeStrategy() {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.LocalRepository.setDefaultMergeStrategy"));
}

void LocalRepository::Impl::checkout(const std::u16string& /*branch*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.LocalRepository.checkout"));
}

::kiv::LocalRepository LocalRepository::Impl::clone(const ::kiv::Repository& /*origin*/,
                                                    ::kiv::RepoType /*repoType*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.LocalRepository.clone"));
}

::kiv::LocalRepository LocalRepository::Impl::create(const qf::zero::Model& /*kivModel*/,
                                                     const qf::zero::Model& /*baseModel*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.LocalRepository.create"));
}

void LocalRepository::Impl::synchronousPush(::kiv::PushMode /*mode*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.LocalRepository.synchronousPush"));
}

void LocalRepository::Impl::synchronousPull() {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.LocalRepository.synchronousPull"));
}

void LocalRepository::Impl::startObservingOrigin() {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.LocalRepository.startObservingOrigin"));
}

void LocalRepository::Impl::stopObservingOrigin() {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.LocalRepository.stopObservingOrigin"));
}

void LocalRepository::Impl::repositoryModified(const ::kiv::Repository& /*src*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.LocalRepository.repositoryModified"));
}

void LocalRepository::Impl::load(const ::kiv::Dependency& /*history*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.LocalRepository.load"));
}

void LocalRepository::Impl::requestPull(const ::kiv::Dependency& /*src*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.LocalRepository.requestPull"));
}

void LocalRepository::Impl::setOnReceive() {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.LocalRepository.setOnReceive"));
}

}  // namespace kiv
