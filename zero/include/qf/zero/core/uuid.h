// Element identity: the Boost UUID, its text form, and a cheap generator.
//
//   qf::zero::Uuid id = qf::zero::generateNewUuid();
//   std::string text = qf::zero::toText(id);   // "0b2c...-..."
#pragma once

#include <boost/uuid/uuid.hpp>

#include <optional>
#include <string>
#include <string_view>

namespace qf::zero {

using Uuid = boost::uuids::uuid;

// A fresh random (version 4) UUID. The generator is seeded once per thread, so a
// call costs no system call; safe to call from any thread.
Uuid generateNewUuid();

// Canonical lower-case text form, "xxxxxxxx-xxxx-xxxx-xxxx-xxxxxxxxxxxx".
std::string toText(const Uuid& id);
std::u16string toText16(const Uuid& id);

// Parses the canonical form (braces and upper case accepted); empty when malformed.
std::optional<Uuid> parseUuid(std::string_view text);
// The same for text held as UTF-16, without converting it first.
std::optional<Uuid> parseUuid(std::u16string_view text);

// Name-based (version 3, MD5) UUID of a name in a namespace: the same inputs give
// the same UUID in every run, which is what fixed metamodel identities need.
Uuid nameBasedUuid(const Uuid& nameSpace, std::string_view name);

}  // namespace qf::zero
