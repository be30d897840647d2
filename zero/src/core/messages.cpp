#include "qf/zero/core/messages.h"

namespace qf0::messages {

namespace {

using foundation::core::except::Catalog;
using foundation::core::except::CatalogEntry;

constexpr CatalogEntry entries[] = {
    {"CannotAddIncompatibleTypes", "Cannot add a value of type '{2}' where type '{1}' is expected."},
    {"CannotAddNonExistentObject", "Cannot add an object that does not exist."},
    {"CannotAddSecondObject", "Cannot add a second object to a single-valued property."},
    {"CannotCastIncompatibleTypes", "Cannot cast the value to the incompatible type '{1}'."},
    {"CannotCreateCrossModelAssociation", "Cannot associate elements that belong to different models."},
    {"CannotCreateWithoutModel", "Cannot create an element without a model."},
    {"CannotModifyProxy", "Cannot modify a proxy; resolve it to its element first."},
    {"CannotSetReadOnlyProperty", "Cannot set the read-only property '{1}'."},
    {"InvalidValue", "The value is not valid here."},
    {"NoSuchProperty", "The type '{1}' has no property '{2}'."},
    {"NoSuchType", "The type '{1}' is not registered."},
    {"UniquenessConstraint", "The value is already present in a property whose values must be unique."},
    {"CannotCreateCircularContainment", "Cannot contain an element within itself or one of its descendants."},
    {"CannotModifyDestroyedElement", "Cannot modify an element that has been destroyed."},
    {"CannotModifyFrozenModel", "Cannot modify a frozen model."},
    {"CannotSetSetOnceProperty", "The property '{1}' can be set only once and already has a value."},
    {"CannotInstantiateAbstractClass", "Cannot instantiate the abstract class '{1}'."},
    {"DuplicateElementId", "An element with the id {1} already exists in the model."},
    {"NoSuchClass", "The class '{1}' is not registered."},
    {"NoSuchOperation", "The type '{1}' has no operation '{2}'."},
    {"ElementRequired", "The operation {1} needs a live element and was given none."},
    {"NotImplemented", "The operation {1} is not implemented in this version."},
    {"WrongArgumentCount", "The operation '{1}' takes {2} arguments but was given {3}."},
    {"IndexOutOfRange", "The index {1} is out of range for size {2}."},
    {"TransactionNotOpen", "No transaction is open."},
    {"TransactionAborted", "The transaction was aborted and cannot be committed."},
    {"CannotResolveProxy", "Cannot resolve the proxy for element {1}."},
    {"TypeAlreadyRegistered", "The type '{1}' is already registered."},
    {"ModelDestroyed", "The model has been destroyed."},
    {"MalformedDocument", "The document is malformed: {1}."},
    {"UnsupportedFormatVersion", "The document format version '{1}' is not supported."},
    {"WrongJsonType", "The value of '{1}' must be {2} but is {3}."},
    {"DanglingReference",
     "The property '{1}' refers to element {2}, which is neither in the document nor in the model."},
    {"ChannelClosed", "The channel is closed: {1}."},
    {"ExchangeFailed", "No '{1}' reply arrived: {2}."},
    {"MalformedPacket", "The packet is malformed: {1}."},
    {"PacketTooLarge", "The packet of {1} bytes exceeds the limit of {2} bytes."},
    {"UnknownPacketType", "No handler accepts packets of type '{1}'."},
    {"PacketHandlerFailed", "{2} (while handling a '{1}' packet)."},
    {"ConnectionFailed", "Cannot connect to {1}: {2}."},
    {"ListenFailed", "Cannot listen on {1}: {2}."},
    {"CannotCreateTransportWithoutChannel", "Cannot create a packet transport without a channel."},
    {"ChannelAlreadyStarted", "The channel has already been started; a channel is started only once."},
};

constexpr Catalog messagesCatalog{"qf0:messages", entries};

}  // namespace

const Catalog& catalog() { return messagesCatalog; }

}  // namespace qf0::messages
