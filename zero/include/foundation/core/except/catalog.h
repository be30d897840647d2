#pragma once

#include <cstddef>
#include <optional>
#include <span>
#include <string_view>

namespace foundation::core::except {

// One message of a catalog. The text refers to the message's arguments by position with
// placeholders {1}, {2}, ...; a placeholder may appear anywhere, more than once, or not at all.
struct CatalogEntry {
  std::string_view key;
  std::string_view text;
};

// A constant table of message texts, identified by its name (e.g. "qf0:messages"). A catalog
// views storage it does not own: define the entries as a static array next to it. Nothing is
// registered anywhere; a message finds its catalog through the function that returns it.
class Catalog {
 public:
  template <std::size_t N>
  constexpr Catalog(std::string_view name, const CatalogEntry (&entries)[N]) noexcept
      : name_(name), entries_(entries, N) {}
  constexpr Catalog(std::string_view name, std::span<const CatalogEntry> entries) noexcept
      : name_(name), entries_(entries) {}

  constexpr std::string_view name() const noexcept { return name_; }
  constexpr std::span<const CatalogEntry> entries() const noexcept { return entries_; }

  constexpr std::optional<std::string_view> textOf(std::string_view key) const noexcept {
    for (const CatalogEntry& entry : entries_)
      if (entry.key == key) return entry.text;
    return std::nullopt;
  }

 private:
  std::string_view name_;
  std::span<const CatalogEntry> entries_;
};

}  // namespace foundation::core::except
