// FlatTable: a map held in one array probed linearly, for the framework's hot look-ups (a
// model's elements by UUID, a collection's members by element).
//
// A model looks its elements up by UUID on every creation, refresh and reference it reads:
// a node-based map there costs several cache misses an operation once the model outgrows
// the cache; here an operation touches one or two neighbouring slots.
//
// Contracts: a value that converts to false (a null handle, a zero count) marks a free
// slot, so such a value is never stored (inserting one is refused; a value changed through
// find must not become one: erase instead). Keys are UUIDs or
// pointers. The hash is keyed with a seed given per table: a table of UUIDs that a peer
// may choose is given a random one, so that the peer cannot choose their slots. The order
// of forEach follows the slots and is unspecified. Not thread-safe.
#pragma once

#include "qf/zero/core/uuid.h"

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <utility>
#include <vector>

namespace qf::zero::internal {

// A bijective finaliser: every input bit reaches every output bit.
constexpr std::uint64_t mixBits(std::uint64_t x) noexcept {
  x ^= x >> 33;
  x *= 0xff51afd7ed558ccdULL;
  x ^= x >> 33;
  x *= 0xc4ceb9fe1a85ec53ULL;
  x ^= x >> 33;
  return x;
}

inline std::uint64_t flatTableHash(const Uuid& id, std::uint64_t seed) noexcept {
  std::uint64_t low;
  std::uint64_t high;
  std::memcpy(&low, id.data, 8);
  std::memcpy(&high, id.data + 8, 8);
  return mixBits(low ^ mixBits(high ^ seed));
}

// A seed no peer can predict, for a table keyed by UUIDs that a peer may choose. Drawn
// from a generator of its own: the one behind generateNewUuid shows its output to peers.
std::uint64_t randomTableSeed();

// The keyed hash for a standard container of UUIDs that a peer may choose: each hasher
// draws its own seed, so that no peer can choose colliding keys.
struct KeyedUuidHash {
  std::uint64_t seed = randomTableSeed();
  std::size_t operator()(const Uuid& id) const noexcept {
    return static_cast<std::size_t>(flatTableHash(id, seed));
  }
};

template <class T>
std::uint64_t flatTableHash(const T* pointer, std::uint64_t seed) noexcept {
  return mixBits(reinterpret_cast<std::uintptr_t>(pointer) ^ seed);
}

template <class Key, class Handle>
class FlatTable {
 public:
  // `seed` keys the hash; any value works, a random one resists chosen collisions.
  explicit FlatTable(std::uint64_t seed = 0) : seed_(seed) {}

  std::uint64_t seed() const noexcept { return seed_; }
  std::size_t size() const noexcept { return size_; }
  bool empty() const noexcept { return size_ == 0; }

  Handle* find(const Key& id) noexcept {
    if (size_ == 0) return nullptr;
    for (std::size_t at = slotOf(id);; at = (at + 1) & mask()) {
      Slot& slot = slots_[at];
      if (!slot.value) return nullptr;
      if (slot.id == id) return &slot.value;
    }
  }
  const Handle* find(const Key& id) const noexcept { return const_cast<FlatTable*>(this)->find(id); }

  // Stores `value` under `id` unless `id` is taken or `value` is null; true when stored.
  bool tryInsert(const Key& id, Handle value) {
    if (!value) return false;
    reserveOneMore();
    Slot& slot = probe(id);
    if (slot.value) return false;
    slot.id = id;
    slot.value = std::move(value);
    ++size_;
    return true;
  }

  // Stores `value` under `id`, replacing what `id` held. A null `value` erases `id`.
  void insertOrAssign(const Key& id, Handle value) {
    if (!value) {
      erase(id);
      return;
    }
    reserveOneMore();
    Slot& slot = probe(id);
    if (!slot.value) {
      slot.id = id;
      ++size_;
    }
    slot.value = std::move(value);
  }

  // Makes room for `count` entries in all without growing again.
  void reserve(std::size_t count) {
    std::size_t wanted = slots_.empty() ? 16 : slots_.size();
    while (wanted < 2 * count) wanted *= 2;
    if (wanted > slots_.size()) rehash(wanted);
  }

  // Removes `id`; false when it was not there.
  bool erase(const Key& id) noexcept {
    if (size_ == 0) return false;
    std::size_t hole = slotOf(id);
    for (;; hole = (hole + 1) & mask()) {
      if (!slots_[hole].value) return false;
      if (slots_[hole].id == id) break;
    }
    // Released once the table is whole again: releasing may end an element, whose ending
    // may look the table up.
    [[maybe_unused]] const Handle released = std::exchange(slots_[hole].value, Handle());
    // Backward shift: each later slot of the run moves into the hole unless the hole lies
    // before its home, so every lookup still meets its key before a free slot.
    for (std::size_t next = (hole + 1) & mask(); slots_[next].value; next = (next + 1) & mask()) {
      const std::size_t home = slotOf(slots_[next].id);
      const bool stays = hole <= next ? (hole < home && home <= next) : (hole < home || home <= next);
      if (stays) continue;
      slots_[hole].id = slots_[next].id;
      slots_[hole].value = std::exchange(slots_[next].value, Handle());
      hole = next;
    }
    --size_;
    return true;
  }

  void clear() noexcept {
    [[maybe_unused]] const std::vector<Slot> released = std::exchange(slots_, {});
    size_ = 0;
  }

  // Calls visit(id, handle) for every entry; `visit` must not change the table.
  template <class Visit>
  void forEach(Visit&& visit) {
    for (Slot& slot : slots_) {
      if (slot.value) visit(static_cast<const Key&>(slot.id), slot.value);
    }
  }
  template <class Visit>
  void forEach(Visit&& visit) const {
    for (const Slot& slot : slots_) {
      if (slot.value) visit(slot.id, slot.value);
    }
  }

 private:
  struct Slot {
    Key id{};
    Handle value{};
  };

  std::size_t mask() const noexcept { return slots_.size() - 1; }

  std::size_t slotOf(const Key& id) const noexcept {
    return static_cast<std::size_t>(flatTableHash(id, seed_)) & mask();
  }

  // The slot that holds `id`, or the free slot that ends its run.
  Slot& probe(const Key& id) noexcept {
    for (std::size_t at = slotOf(id);; at = (at + 1) & mask()) {
      Slot& slot = slots_[at];
      if (!slot.value || slot.id == id) return slot;
    }
  }

  // Keeps the load at most one half, so runs stay short.
  void reserveOneMore() {
    if (2 * (size_ + 1) <= slots_.size()) return;
    rehash(slots_.empty() ? 16 : 2 * slots_.size());
  }

  void rehash(std::size_t slotCount) {
    std::vector<Slot> old = std::exchange(slots_, std::vector<Slot>(slotCount));
    for (Slot& slot : old) {
      if (slot.value) probe(slot.id) = std::move(slot);
    }
  }

  std::vector<Slot> slots_;
  std::size_t size_ = 0;
  std::uint64_t seed_;
};

}  // namespace qf::zero::internal
