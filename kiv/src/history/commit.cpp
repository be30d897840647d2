#include "kiv/metamodel/commit_impl.h"

#include "qf/zero/core/messages.h"
#include "qf/zero/core/report_exception.h"

namespace kiv {

bool Commit::Impl::isInitial() const {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Commit.isInitial"));
}

bool Commit::Impl::isMerge() const {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Commit.isMerge"));
}

bool Commit::Impl::isEmpty() const {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Commit.isEmpty"));
}

::kiv::Commit Commit::Impl::getParent() const {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Commit.getParent"));
}

void Commit::Impl::addParent(const ::kiv::Commit& /*parent*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Commit.addParent"));
}

::kiv::Delta Commit::Impl::diff(const ::kiv::Commit& /*predecessor*/) const {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Commit.diff"));
}

std::vector<kiv::Commit> Commit::Impl::findPath(const ::kiv::Commit& /*predecessor*/) const {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Commit.findPath"));
}

::kiv::Delta Commit::Impl::getSnapshot() const {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Commit.getSnapshot"));
}

void Commit::Impl::addCreated(const qf::zero::ModelElement& /*current*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Commit.addCreated"));
}

void Commit::Impl::addUpdated(const qf::zero::ModelElement& /*current*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Commit.addUpdated"));
}

void Commit::Impl::addDeleted(const qf::zero::ModelElement& /*current*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Commit.addDeleted"));
}

::kiv::ObjectStorage Commit::Impl::find(const qf::zero::Uuid& /*uuid*/) const {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Commit.find"));
}

bool Commit::Impl::isPredecessorOf(const ::kiv::Commit& /*commit*/) const {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Commit.isPredecessorOf"));
}

std::vector<std::vector<kiv::Commit>> Commit::Impl::findAllPaths() const {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Commit.findAllPaths"));
}

void Commit::Impl::selectInRange(const std::unordered_set<kiv::Commit>& /*predecessors*/, const std::unordered_set<kiv::Commit>& /*commits*/, std::unordered_set<kiv::Commit>& /*result*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Commit.selectInRange"));
}

void Commit::Impl::select(const std::unordered_set<kiv::Commit>& /*commits*/, std::unordered_set<kiv::Commit>& /*result*/, int /*depth*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Commit.select"));
}

std::vector<std::vector<kiv::Commit>> Commit::Impl::findPathHelper(const std::function<bool(const kiv::Commit&)>& /*pred*/) const {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Commit.findPathHelper"));
}

bool Commit::Impl::isEqual(const ::kiv::Commit& /*commit*/) const {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Commit.isEqual"));
}

void Commit::Impl::wipeOut() {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Commit.wipeOut"));
}

}  // namespace kiv
