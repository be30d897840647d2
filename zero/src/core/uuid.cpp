#include "qf/zero/core/uuid.h"

#include "qf/zero/core/internal/flat_table.h"
#include "qf/zero/core/text.h"

#include <boost/uuid/name_generator_md5.hpp>
#include <boost/uuid/uuid_io.hpp>

#include <array>
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
  if (body.size() != 36 || body[8] != '-' || body[13] != '-' || body[18] != '-' || body[23] != '-') {
    return std::nullopt;
  }
  // Each character's value as a hex digit, or a value with bit 4 set for any other: the
  // digits are decoded without a branch and checked once at the end.
  static constexpr auto kNibbles = [] {
    std::array<std::uint8_t, 256> nibbles{};
    nibbles.fill(0x10);
    for (int c = '0'; c <= '9'; ++c) nibbles[c] = static_cast<std::uint8_t>(c - '0');
    for (int c = 'a'; c <= 'f'; ++c) nibbles[c] = static_cast<std::uint8_t>(c - 'a' + 10);
    for (int c = 'A'; c <= 'F'; ++c) nibbles[c] = static_cast<std::uint8_t>(c - 'A' + 10);
    return nibbles;
  }();
  static constexpr std::array<std::uint8_t, 16> kByteAt{0,  2,  4,  6,  9,  11, 14, 16,
                                                        19, 21, 24, 26, 28, 30, 32, 34};
  Uuid id;
  unsigned invalid = 0;
  for (std::size_t byte = 0; byte < 16; ++byte) {
    const std::uint8_t high = kNibbles[static_cast<unsigned char>(body[kByteAt[byte]])];
    const std::uint8_t low = kNibbles[static_cast<unsigned char>(body[kByteAt[byte] + 1])];
    invalid |= high | low;
    id.data[byte] = static_cast<std::uint8_t>(high << 4 | (low & 0x0f));
  }
  if ((invalid & 0x10) != 0) return std::nullopt;
  return id;
}

std::optional<Uuid> parseUuid(std::u16string_view text) {
  // Only ASCII can be a UUID; anything longer than the braced form is not one.
  char narrow[38];
  if (text.size() > sizeof narrow) return std::nullopt;
  for (std::size_t i = 0; i < text.size(); ++i) {
    if (text[i] > 0x7f) return std::nullopt;
    narrow[i] = static_cast<char>(text[i]);
  }
  return parseUuid(std::string_view(narrow, text.size()));
}

Uuid nameBasedUuid(const Uuid& nameSpace, std::string_view name) {
  boost::uuids::name_generator_md5 generator(nameSpace);
  return generator(name.data(), name.size());
}

}  // namespace qf::zero
