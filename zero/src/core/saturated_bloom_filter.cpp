#include "qf/zero/core/saturated_bloom_filter.h"

#include "qf/zero/core/internal/flat_table.h"

#include <algorithm>
#include <bit>
#include <cstring>

namespace qf::zero {

namespace {

// Ten counters per expected member with seven probes gives about 0.8% false positives; rounding
// the counter count up to a power of two only lowers that.
constexpr std::uint64_t countersPerMember = 10;
constexpr std::uint64_t minimumCounters = 64;
constexpr std::uint64_t maximumExpectedCount = std::uint64_t{1} << 56;

}  // namespace

SaturatedBloomFilter::SaturatedBloomFilter(std::size_t expectedCount) {
  const std::uint64_t expected = std::min<std::uint64_t>(expectedCount, maximumExpectedCount);
  const std::uint64_t wanted = std::max(minimumCounters, expected * countersPerMember);
  const std::uint64_t counters = std::bit_ceil(wanted);
  mask_ = counters - 1;
  nibbles_.assign(counters / 2, 0);
}

// Double hashing over the two halves of the uuid: probe i is start + i * step modulo the counter
// count. With a power-of-two count and an odd step the probes of one uuid are all distinct.
SaturatedBloomFilter::Probe SaturatedBloomFilter::probeOf(const boost::uuids::uuid& id) const noexcept {
  std::uint64_t high = 0;
  std::uint64_t low = 0;
  static_assert(sizeof(id.data) == 2 * sizeof(std::uint64_t));
  std::memcpy(&high, id.data, sizeof high);
  std::memcpy(&low, id.data + sizeof high, sizeof low);
  // Random uuids are already uniform, but version-1, name-based or hand-made test uuids are
  // not (fixed version bits, counters in a few bytes): the finaliser spreads every input bit
  // over the whole word, so such uuids do not pile onto the same counters.
  using internal::mixBits;
  return Probe{mixBits(high ^ mixBits(low)), mixBits(low) | 1};
}

std::size_t SaturatedBloomFilter::slot(const Probe& probe, unsigned i) const noexcept {
  return static_cast<std::size_t>((probe.start + i * probe.step) & mask_);
}

std::uint8_t SaturatedBloomFilter::counter(std::size_t index) const noexcept {
  const std::uint8_t byte = nibbles_[index / 2];
  return (index % 2 == 0) ? (byte & 0x0F) : (byte >> 4);
}

void SaturatedBloomFilter::setCounter(std::size_t index, std::uint8_t value) noexcept {
  std::uint8_t& byte = nibbles_[index / 2];
  if (index % 2 == 0)
    byte = static_cast<std::uint8_t>((byte & 0xF0) | value);
  else
    byte = static_cast<std::uint8_t>((byte & 0x0F) | (value << 4));
}

void SaturatedBloomFilter::add(const boost::uuids::uuid& id) {
  const Probe probe = probeOf(id);
  for (unsigned i = 0; i < hashCount; ++i) {
    const std::size_t index = slot(probe, i);
    const std::uint8_t value = counter(index);
    if (value != saturatedValue) setCounter(index, value + 1);
  }
}

bool SaturatedBloomFilter::contains(const boost::uuids::uuid& id) const {
  const Probe probe = probeOf(id);
  for (unsigned i = 0; i < hashCount; ++i)
    if (counter(slot(probe, i)) == 0) return false;
  return true;
}

void SaturatedBloomFilter::remove(const boost::uuids::uuid& id) {
  if (!contains(id)) return;
  const Probe probe = probeOf(id);
  for (unsigned i = 0; i < hashCount; ++i) {
    const std::size_t index = slot(probe, i);
    const std::uint8_t value = counter(index);
    if (value != saturatedValue) setCounter(index, value - 1);
  }
}

void SaturatedBloomFilter::clear() { std::fill(nibbles_.begin(), nibbles_.end(), 0); }

}  // namespace qf::zero
