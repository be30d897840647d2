#pragma once

#include "foundation/core/except/catalog.h"
#include "foundation/core/except/message.h"

#include <string>

// Messages of the version-control library, catalog "kiv:messages". Raise them with
// qf::zero::reportException, e.g. reportException(kiv::messages::NoOrigin()).
namespace kiv::messages {

const foundation::core::except::Catalog& catalog();

FOUNDATION_MESSAGE(catalog, BranchExists, std::u16string)    // branch name
FOUNDATION_MESSAGE(catalog, CannotAddParent, std::string)    // parent commit uuid text
FOUNDATION_MESSAGE(catalog, CannotCheckout, std::u16string)  // branch name
FOUNDATION_MESSAGE(catalog, CannotCommit)
FOUNDATION_MESSAGE(catalog, CannotComposeZeroDeltas)
FOUNDATION_MESSAGE(catalog, CannotFindElement, std::u16string)  // commit uuid text
FOUNDATION_MESSAGE(catalog, CannotPull)
FOUNDATION_MESSAGE(catalog, CannotPush)
FOUNDATION_MESSAGE(catalog, CannotRedo)
FOUNDATION_MESSAGE(catalog, CannotUndo)
FOUNDATION_MESSAGE(catalog, HeadDelete)
FOUNDATION_MESSAGE(catalog, MalformedHistory, std::string)  // what is wrong, e.g. "cyclic parents"
FOUNDATION_MESSAGE(catalog, ModelsIdentical)
FOUNDATION_MESSAGE(catalog, ModelsSwapped)
FOUNDATION_MESSAGE(catalog, NoOrigin)
FOUNDATION_MESSAGE(catalog, NoSuchElement, std::string)     // element uuid text
FOUNDATION_MESSAGE(catalog, NoSuchElementCur, std::string)  // element uuid text
FOUNDATION_MESSAGE(catalog, NoUniqueLCA)
FOUNDATION_MESSAGE(catalog, PushBare)
FOUNDATION_MESSAGE(catalog, UnexpectedPacket, std::string)  // what was expected, e.g. "expecting OK"

}  // namespace kiv::messages
