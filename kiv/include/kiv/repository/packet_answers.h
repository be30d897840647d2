// The answers a served local repository gives to the requests of its peers. A local
// repository's own transport (setOnReceive) and a server that shares one repository among
// many connections answer through these same functions.
//
// Each answer uses the repository model on the calling thread: the caller makes sure that
// no other thread uses it meanwhile. A request that cannot be answered raises the
// catalog error that says why and changes nothing: every change is made in one
// transaction that rolls back.
#pragma once

#include "kiv/metamodel/local_repository.h"
#include "qf/zero/io/json_packet.h"

namespace kiv {

// Raises "MalformedPacket" unless the request's body is null, as it is for "PullInfo",
// "AddRemoteObserver" and "RemoveRemoteObserver": a peer that sends anything else there does
// not speak this protocol, and is told so rather than answered as if it did.
void requireNullBody(const qf::zero::io::JSONPacket& request);

// "RepoInfo": {"isBare": <boolean>, "head": <name of the head branch, "" for none>}.
qf::zero::io::JSONPacket answerPullInfo(const LocalRepository& served);

// "History": what the asker lacks. The request carries the asker's branch states; the
// reply holds them as its previous states, the served branches as its current ones and
// the commits between, with their deltas and storages. Answering changes nothing.
qf::zero::io::JSONPacket answerPull(const LocalRepository& served, const qf::zero::io::JSONPacket& request);

// "OK" when the pushed history was made against the served repository as it is now
// (canPush) and its branches have been taken over; "CannotPush" otherwise, with nothing
// changed. Both with a null body. A malformed history raises ("MalformedHistory", the
// parser's errors, "DanglingReference" for a commit, delta or storage that is neither
// carried nor known).
qf::zero::io::JSONPacket answerPush(const LocalRepository& served, const qf::zero::io::JSONPacket& request);

// "OK", after raising (`adding`) or lowering (never below zero) numRemoteObservers and
// keeping the repository listener while someone observes.
qf::zero::io::JSONPacket answerObserver(const LocalRepository& served, bool adding);

}  // namespace kiv
