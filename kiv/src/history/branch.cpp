#include "kiv/metamodel/branch_impl.h"

#include "qf/zero/core/messages.h"
#include "qf/zero/core/report_exception.h"

namespace kiv {

bool Branch::Impl::isEmpty() const {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Branch.isEmpty"));
}

bool Branch::Impl::canUndo() const {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Branch.canUndo"));
}

bool Branch::Impl::canRedo() const {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Branch.canRedo"));
}

::kiv::Delta Branch::Impl::undo() {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Branch.undo"));
}

::kiv::Delta Branch::Impl::redo() {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Branch.redo"));
}

void Branch::Impl::commit(const ::kiv::Commit& /*commit*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Branch.commit"));
}

::kiv::Branch Branch::Impl::clone(const qf::zero::Model& /*model*/) const {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Branch.clone"));
}

bool Branch::Impl::isEquivalent(const ::kiv::Branch& /*branch*/, bool /*deep*/) const {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Branch.isEquivalent"));
}

bool Branch::Impl::canCommit(const ::kiv::Commit& /*commit*/) const {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Branch.canCommit"));
}

void Branch::Impl::update(const ::kiv::Branch& /*src*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Branch.update"));
}

bool Branch::Impl::isPredecessorOf(const ::kiv::Branch& /*branch*/) const {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Branch.isPredecessorOf"));
}

void Branch::Impl::merge(const ::kiv::Branch& /*src*/, const kiv::IMergeStrategy& /*ms*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Branch.merge"));
}

::kiv::Commit Branch::Impl::findCommitByUUID(const ::kiv::Commit& /*commit*/) const {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Branch.findCommitByUUID"));
}

bool Branch::Impl::areBranchMapsEquivalent(const std::map<std::u16string, kiv::Branch>& /*bm1*/, const std::map<std::u16string, kiv::Branch>& /*bm2*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Branch.areBranchMapsEquivalent"));
}

}  // namespace kiv
