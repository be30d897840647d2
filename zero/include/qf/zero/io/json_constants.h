// The member names of the framework's JSON documents.
//
//   {"version": "1.0",
//    "entries": [{"type": "library.Book", "id": "<uuid>", "content": {"title": "Dune", ...}}, ...]}
//
// One entry per element. Content members are property names; a reference or a
// contained child is written as the target's UUID text, a many-valued property as
// an array, an absent optional value as null.
#pragma once

namespace qf::zero::io {

// The member names and the format version of the documents the serializer writes and the
// parser reads.
struct JSONConstants {
  static constexpr const char* VERSION_ATTR = "version";
  static constexpr const char* ENTRIES_ATTR = "entries";
  static constexpr const char* PACKAGES_ATTR = "packages";
  static constexpr const char* TYPE_ATTR = "type";
  static constexpr const char* ID_ATTR = "id";
  static constexpr const char* CONTENT_ATTR = "content";
  static constexpr const char* FORMAT_VERSION = "1.0";

  // The members of a change report: arrays of entries.
  static constexpr const char* ADDED_ATTR = "added";
  static constexpr const char* MODIFIED_ATTR = "modified";
  static constexpr const char* DESTROYED_ATTR = "destroyed";
};

}  // namespace qf::zero::io
