#pragma once

#include <boost/uuid/uuid.hpp>

#include <cstddef>
#include <cstdint>
#include <vector>

namespace qf::zero {

// A counting Bloom filter over uuids with 4-bit counters that saturate. A counter that reaches
// its maximum is never decremented again, so contains() never misses a uuid that was added and
// not removed, however many adds and removes happen; the price is that saturated counters stay
// set and can only raise the false-positive rate. Adding a uuid several times is counted: it
// stays a member until removed as many times.
//
// remove(x) is meant for members only. Removing a uuid that is definitely absent (some counter
// is zero) does nothing; removing one that is absent but looks present (a false positive) would
// decrement other members' counters, so callers must not do it.
class SaturatedBloomFilter {
 public:
  static constexpr std::size_t defaultExpectedCount = 1024;
  static constexpr unsigned hashCount = 7;
  static constexpr std::uint8_t saturatedValue = 15;

  // Sized for a false-positive rate below 1% while at most expectedCount uuids are members.
  explicit SaturatedBloomFilter(std::size_t expectedCount = defaultExpectedCount);

  void add(const boost::uuids::uuid& id);
  bool contains(const boost::uuids::uuid& id) const;
  void remove(const boost::uuids::uuid& id);
  void clear();

  std::size_t counterCount() const noexcept { return static_cast<std::size_t>(mask_ + 1); }

 private:
  struct Probe {
    std::uint64_t start;
    std::uint64_t step;
  };
  Probe probeOf(const boost::uuids::uuid& id) const noexcept;
  std::size_t slot(const Probe& probe, unsigned i) const noexcept;
  std::uint8_t counter(std::size_t index) const noexcept;
  void setCounter(std::size_t index, std::uint8_t value) noexcept;

  std::uint64_t mask_;                 // counter count - 1; the count is a power of two
  std::vector<std::uint8_t> nibbles_;  // two counters per byte, low nibble first
};

}  // namespace qf::zero
