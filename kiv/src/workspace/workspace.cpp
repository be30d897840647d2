#include "kiv/metamodel/workspace_impl.h"
#include "qf/zero/core/messages.h"
#include "qf/zero/core/report_exception.h"

namespace kiv {

bool Workspace::Impl::canRedo() const {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Workspace.canRedo"));
}

bool Workspace::Impl::canUndo() const {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Workspace.canUndo"));
}

bool Workspace::Impl::canCommit() const {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Workspace.canCommit"));
}

bool Workspace::Impl::canCheckout(const std::u16string& /*name*/) const {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Workspace.canCheckout"));
}

void Workspace::Impl::updateContext() {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Workspace.updateContext"));
}

std::future<void> Workspace::Impl::push(::kiv::PushMode /*mode*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Workspace.push"));
}

std::future<void> Workspace::Impl::pull() {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Workspace.pull"));
}

void Workspace::Impl::takeSnapshot() {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Workspace.takeSnapshot"));
}

void Workspace::Impl::undo() {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Workspace.undo"));
}

void Workspace::Impl::redo() {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Workspace.redo"));
}

void Workspace::Impl::setContext(const ::kiv::Commit& /*commit*/, ::kiv::SetContextMode /*mode*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Workspace.setContext"));
}

void Workspace::Impl::branch(const std::u16string& /*name*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Workspace.branch"));
}

void Workspace::Impl::checkout(const std::u16string& /*branch*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Workspace.checkout"));
}

void Workspace::Impl::merge(const std::u16string& /*srcBranch*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Workspace.merge"));
}

void Workspace::Impl::commit(const ::kiv::Commit& /*commit*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Workspace.commit"));
}

::kiv::Commit Workspace::Impl::getContext() const {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Workspace.getContext"));
}

void Workspace::Impl::init(const qf::zero::Model& /*baseModel*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Workspace.init"));
}

void Workspace::Impl::update(const ::kiv::Delta& /*delta*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Workspace.update"));
}

void Workspace::Impl::commitTransaction(const std::function<void()>& /*fun*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Workspace.commitTransaction"));
}

void Workspace::Impl::commitTransaction(const qf::zero::HxArray& /*fun*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Workspace.commitTransaction"));
}

void Workspace::Impl::synchronousPush(::kiv::PushMode /*mode*/) {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Workspace.synchronousPush"));
}

void Workspace::Impl::synchronousPull() {
  qf::zero::reportException(qf0::messages::NotImplemented(u"kiv.Workspace.synchronousPull"));
}

}  // namespace kiv
