// The checks a received history passes before anything uses it.
#pragma once

#include "kiv/metamodel/protocol/history.h"

namespace kiv::protocol {

// Raises "MalformedHistory" saying what is wrong when two branches of one set share a
// name, when a carried commit is its own ancestor through carried commits, or when a
// carried delta holds a storage under another element's UUID. References that resolve
// nowhere were refused by the parse already.
void checkReceivedHistory(const History& history);

// Raises "MalformedHistory" when a storage entry of `document` does not hold the entry of the
// element it names (or null when it names none). Entries the parser refuses anyway are
// passed over.
void checkStorageEntries(const qf::zero::JsonValue& document);

}  // namespace kiv::protocol
