// loadContext: fills a user model with the state of its workspace's context.
//
// A workspace's init records the head tip as its context without touching the user model,
// so a workspace bound to a fresh user model over a cloned (or reopened) repository
// reflects a commit its model does not show, and updateContext cannot help, since the
// context is already the tip. Load it once after binding:
//
//   kiv::LocalRepository clone = kiv::LocalRepository::clone(origin, kiv::RepoType::Regular);
//   kiv::Workspace workspace = clone->getWorkspace(userModel);
//   kiv::loadContext(workspace);     // userModel now holds the head's state; no commit is made
#pragma once

#include "kiv/metamodel/workspace.h"

namespace kiv {

// Makes the user model hold exactly the state of the workspace's context commit, without
// making a commit: elements the state lacks are destroyed, the others are made or refreshed
// in place (handles to them stay valid). With no context, the user model is emptied. One
// transaction of each model; a failure leaves both as they were.
// REQUIRES: `workspace` was initialised with a user model.
void loadContext(const Workspace& workspace);

}  // namespace kiv
