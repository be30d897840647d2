// A packed history written straight as text.
#pragma once

#include "kiv/metamodel/protocol/history.h"

#include <string>

namespace kiv::protocol {

// The text of history.pack(), byte for byte, made without building the document first: the
// stored entries are copied as the storages keep them. Like pack(), it resolves the commits
// and fills the delta and storage sets first. Raises "ElementRequired" for a null history.
std::string packAsText(const History& history);

}  // namespace kiv::protocol
