#pragma once

#include "foundation/core/except/catalog.h"
#include "foundation/core/except/message.h"
#include "foundation/core/except/message_argument.h"

#include <cstdint>
#include <string>

// Messages of the model framework, catalog "qf0:messages". Raise them with
// qf::zero::reportException, e.g. reportException(qf0::messages::NoSuchType(u"Widget")).
namespace qf0::messages {

using foundation::core::except::MessageArgument;

const foundation::core::except::Catalog& catalog();

FOUNDATION_MESSAGE(catalog, CannotAddIncompatibleTypes, std::u16string, std::u16string)  // expected, given
FOUNDATION_MESSAGE(catalog, CannotAddNonExistentObject)
FOUNDATION_MESSAGE(catalog, CannotAddSecondObject)
FOUNDATION_MESSAGE(catalog, CannotCastIncompatibleTypes, MessageArgument)  // type asked for
FOUNDATION_MESSAGE(catalog, CannotCreateCrossModelAssociation)
FOUNDATION_MESSAGE(catalog, CannotCreateWithoutModel)
FOUNDATION_MESSAGE(catalog, CannotModifyProxy)
FOUNDATION_MESSAGE(catalog, CannotSetReadOnlyProperty, MessageArgument)  // qualified property name
FOUNDATION_MESSAGE(catalog, InvalidValue)
FOUNDATION_MESSAGE(catalog, NoSuchProperty, std::u16string, std::u16string)  // type name, property name
FOUNDATION_MESSAGE(catalog, NoSuchType, std::u16string)                      // type name
FOUNDATION_MESSAGE(catalog, UniquenessConstraint)

// Raised inside the framework only.
FOUNDATION_MESSAGE(catalog, CannotCreateCircularContainment)
FOUNDATION_MESSAGE(catalog, CannotModifyDestroyedElement)
FOUNDATION_MESSAGE(catalog, CannotModifyFrozenModel)
FOUNDATION_MESSAGE(catalog, CannotSetSetOnceProperty, MessageArgument)        // qualified property name
FOUNDATION_MESSAGE(catalog, CannotInstantiateAbstractClass, std::u16string)   // class name
FOUNDATION_MESSAGE(catalog, DuplicateElementId, std::string)                  // element uuid text
FOUNDATION_MESSAGE(catalog, NoSuchClass, std::u16string)                      // qualified class name
FOUNDATION_MESSAGE(catalog, NoSuchOperation, std::u16string, std::u16string)  // type name, operation name
// An operation was given a null or destroyed element where it needs a live one.
FOUNDATION_MESSAGE(catalog, ElementRequired, std::u16string)  // qualified operation name
// An operation a metamodel declares but this build does not implement yet.
FOUNDATION_MESSAGE(catalog, NotImplemented, std::u16string)  // qualified operation name
FOUNDATION_MESSAGE(catalog, WrongArgumentCount, std::u16string, std::int64_t,
                   std::int64_t)                                          // operation, expected, given
FOUNDATION_MESSAGE(catalog, IndexOutOfRange, std::int64_t, std::int64_t)  // index, size
FOUNDATION_MESSAGE(catalog, TransactionNotOpen)
FOUNDATION_MESSAGE(catalog, TransactionAborted)
FOUNDATION_MESSAGE(catalog, CannotResolveProxy, std::string)        // element uuid text
FOUNDATION_MESSAGE(catalog, TypeAlreadyRegistered, std::u16string)  // qualified type name
FOUNDATION_MESSAGE(catalog, ModelDestroyed)

// Reading JSON documents and change reports.
FOUNDATION_MESSAGE(catalog, MalformedDocument, std::string)         // what is wrong, where
FOUNDATION_MESSAGE(catalog, UnsupportedFormatVersion, std::string)  // version found
FOUNDATION_MESSAGE(catalog, WrongJsonType, std::u16string, std::string,
                   std::string)                                              // property, expected, found
FOUNDATION_MESSAGE(catalog, DanglingReference, std::u16string, std::string)  // property, element uuid text

// Packets and channels.
FOUNDATION_MESSAGE(catalog, ChannelClosed, std::string)                  // why
FOUNDATION_MESSAGE(catalog, ExchangeFailed, std::string, std::string)    // reply type awaited, why
FOUNDATION_MESSAGE(catalog, MalformedPacket, std::string)                // what is wrong
FOUNDATION_MESSAGE(catalog, PacketTooLarge, std::int64_t, std::int64_t)  // size, limit
FOUNDATION_MESSAGE(catalog, UnknownPacketType, std::string)              // packet type
// A packet handler threw something that is not a catalog message.
FOUNDATION_MESSAGE(catalog, PacketHandlerFailed, std::string, std::string)  // packet type, what it threw
FOUNDATION_MESSAGE(catalog, ConnectionFailed, std::string, std::string)     // endpoint, why
FOUNDATION_MESSAGE(catalog, ListenFailed, std::string, std::string)         // endpoint, why
FOUNDATION_MESSAGE(catalog, CannotCreateTransportWithoutChannel)
FOUNDATION_MESSAGE(catalog, ChannelAlreadyStarted)

}  // namespace qf0::messages
