// parseJson: JSON text to an ordered document, the same value nlohmann's parse gives.
#pragma once

#include <nlohmann/json_fwd.hpp>

#include <string_view>

namespace qf::zero {

// Parses `text` exactly as nlohmann::ordered_json::parse does: the same value (member order
// kept, a repeated key's last value in its first place), the same exceptions for the same
// faults. It is faster on objects: an ordered object keeps its members in a vector of pairs
// with a const key, which nlohmann's parser grows member by member, copying every member
// already read (whole subtrees) each time the vector grows. Here each object's members are
// gathered first and the object is built once.
nlohmann::ordered_json parseJson(std::string_view text);

}  // namespace qf::zero
