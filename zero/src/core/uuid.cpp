#include "qf/zero/core/uuid.h"

#include "qf/zero/core/internal/flat_table.h"
#include "qf/zero/core/text.h"

#include <boost/uuid/name_generator_md5.hpp>
#include <boost/uuid/uuid_io.hpp>

#include <random>

namespace qf::zero {

namespace {

std::mt19937_64 seededEngine() {
  std::random_device device;
  std::seed_seq seed{device(), device(), device(), device(), device(), device(), device(), device()};
  return std::mt19937_64(seed);
}

}  // namespace

namespace internal {

std::uint64_t randomTableSeed() {
  thread_local std::mt19937_64 engine = seededEngine();
  return engine();
}

}  // namespace internal

Uuid generateNewUuid() {
  thread_local std::mt19937_64 engine = seededEngine();
  Uuid id;
  const std::uint64_t high = engine();
  const std::uint64_t low = engine();
  for (int i = 0; i < 8; ++i) {
    id.data[i] = static_cast<std::uint8_t>(high >> (8 * i));
    id.data[8 + i] = static_cast<std::uint8_t>(low >> (8 * i));
  }
  id.data[6] = static_cast<std::uint8_t>((id.data[6] & 0x0F) | 0x40);  // version 4
  id.data[8] = static_cast<std::uint8_t>((id.data[8] & 0x3F) | 0x80);  // RFC 4122 variant
  return id;
}

std::string toText(const Uuid& id) { return boost::uuids::to_string(id); }

std::u16string toText16(const Uuid& id) { return toUtf16(toText(id)); }

// The canonical form only (8-4-4-4-12 hex digits, optionally in braces), decoded in the
// same pass that checks it: the general string generator costs several times more, and
// every reference read from a document goes through here.
std::optional<Uuid> parseUuid(std::string_view text) {
  std::string_view body = text;
  if (body.size() == 38 && body.front() == '{' && body.back() == '}') body = body.substr(1, 36);
  if (body.size() != 36) return std::nullopt;
  const auto nibble = [](char c) -> int {
    if (c >= '0' && c <= '9') return c - '0';
    if (c >= 'a' && c <= 'f') return c - 'a' + 10;
    if (c >= 'A' && c <= 'F') return c - 'A' + 10;
    return -1;
  };
  Uuid id;
  std::size_t byte = 0;
  for (std::size_t i = 0; i < body.size();) {
    if (i == 8 || i == 13 || i == 18 || i == 23) {
      if (body[i++] != '-') return std::nullopt;
      continue;
    }
    const int high = nibble(body[i]);
    const int low = nibble(body[i + 1]);
    if (high < 0 || low < 0) return std::nullopt;
    id.data[byte++] = static_cast<std::uint8_t>(high << 4 | low);
    i += 2;
  }
  return id;
}

Uuid nameBasedUuid(const Uuid& nameSpace, std::string_view name) {
  boost::uuids::name_generator_md5 generator(nameSpace);
  return generator(name.data(), name.size());
}

}  // namespace qf::zero
