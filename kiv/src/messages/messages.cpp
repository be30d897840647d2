#include "kiv/messages/messages.h"

namespace kiv::messages {

namespace {

using foundation::core::except::Catalog;
using foundation::core::except::CatalogEntry;

constexpr CatalogEntry entries[] = {
    {"BranchExists", "A branch named '{1}' already exists."},
    {"CannotAddParent",
     "Commit {1} cannot become a parent: it descends from the commit, and history must not loop."},
    {"CannotCheckout", "Cannot check out branch '{1}'."},
    {"CannotCommit", "Cannot commit in the current state of the repository."},
    {"CannotComposeZeroDeltas", "Cannot compose an empty sequence of deltas."},
    {"CannotFindElement", "Cannot find the element in commit {1}."},
    {"CannotPull", "Cannot pull from the origin."},
    {"CannotPush", "Cannot push to the origin."},
    {"CannotRedo", "There is nothing to redo."},
    {"CannotUndo", "There is nothing to undo."},
    {"HeadDelete", "Cannot delete the branch that is checked out."},
    {"MalformedHistory", "The history is malformed: {1}."},
    {"ModelsIdentical", "The user model and the repository model must be two different models."},
    {"ModelsSwapped",
     "The models are given the wrong way round: pass the user model first and the repository model second."},
    {"NoOrigin", "The repository has no origin."},
    {"NoSuchElement", "There is no element with id {1}."},
    {"NoSuchElementCur", "There is no element with id {1} in the current version."},
    {"NoUniqueLCA", "The commits have no unique lowest common ancestor."},
    {"PushBare", "Cannot push from a bare repository."},
    {"UnexpectedPacket", "Unexpected packet: {1}."},
};

constexpr Catalog messagesCatalog{"kiv:messages", entries};

}  // namespace

const Catalog& catalog() { return messagesCatalog; }

}  // namespace kiv::messages
