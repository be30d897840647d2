// The open-addressed table against std::unordered_map: a model's elements by UUID, on seeded random
// operations over random and over sequential UUIDs (the ones hand-made documents use), with
// the table's hash keyed and unkeyed.
#include "qf/zero/core/internal/flat_table.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <cstring>
#include <functional>
#include <memory>
#include <random>
#include <tuple>
#include <unordered_map>
#include <utility>
#include <vector>

namespace {

using qf::zero::Uuid;
using Table = qf::zero::internal::FlatTable<Uuid, std::shared_ptr<int>>;

Uuid randomUuid(std::mt19937_64& random) {
  Uuid id{};
  const std::uint64_t halves[2] = {random(), random()};
  std::memcpy(id.data, halves, sizeof halves);
  return id;
}

Uuid sequentialUuid(std::uint32_t n) {
  Uuid id{};
  std::memcpy(id.data + 12, &n, sizeof n);
  return id;
}

struct UuidHash {
  std::size_t operator()(const Uuid& id) const {
    return std::hash<std::string_view>()({reinterpret_cast<const char*>(id.data), 16});
  }
};

class FlatTableProperty : public ::testing::TestWithParam<std::tuple<unsigned, bool, std::uint64_t>> {};

TEST_P(FlatTableProperty, AgreesWithAStandardMap) {
  const auto [seed, sequential, tableSeed] = GetParam();
  SCOPED_TRACE("seed " + std::to_string(seed));
  std::mt19937_64 random(seed);
  // A pool a few times the live size, so that inserts meet taken keys and erases absent ones.
  std::vector<Uuid> pool;
  for (std::uint32_t i = 0; i < 3000; ++i)
    pool.push_back(sequential ? sequentialUuid(i) : randomUuid(random));
  Table table(tableSeed);
  std::unordered_map<Uuid, std::shared_ptr<int>, UuidHash> expected;
  for (int step = 0; step < 40000; ++step) {
    const Uuid& id = pool[random() % pool.size()];
    auto value = std::make_shared<int>(step);
    switch (random() % 5) {
      case 0:
      case 1: {
        const bool stored = table.tryInsert(id, value);
        ASSERT_EQ(stored, expected.emplace(id, value).second) << "step " << step;
        break;
      }
      case 2:
        table.insertOrAssign(id, value);
        expected[id] = value;
        break;
      case 3:
        ASSERT_EQ(table.erase(id), expected.erase(id) == 1) << "step " << step;
        break;
      default: {
        const std::shared_ptr<int>* found = table.find(id);
        const auto it = expected.find(id);
        ASSERT_EQ(found != nullptr, it != expected.end()) << "step " << step;
        if (found != nullptr) {
          ASSERT_EQ(*found, it->second) << "step " << step;
        }
      }
    }
    ASSERT_EQ(table.size(), expected.size());
    // Room made ahead, as a composed state does, moves every entry at once.
    if (step % 10000 == 5000) table.reserve(table.size() + random() % 5000);
  }
  EXPECT_FALSE(table.tryInsert(pool.front(), nullptr)) << "a null handle marks a free slot";
  std::size_t visited = 0;
  std::as_const(table).forEach([&](const Uuid& id, const std::shared_ptr<int>& value) {
    ++visited;
    const auto it = expected.find(id);
    ASSERT_NE(it, expected.end());
    EXPECT_EQ(value, it->second);
  });
  EXPECT_EQ(visited, expected.size());
  for (const auto& [id, value] : expected) ASSERT_TRUE(table.erase(id));
  EXPECT_TRUE(table.empty());
  EXPECT_EQ(table.find(pool.front()), nullptr);
}

INSTANTIATE_TEST_SUITE_P(Seeds, FlatTableProperty,
                         ::testing::Combine(::testing::Values(1u, 2u, 3u), ::testing::Bool(),
                                            ::testing::Values(std::uint64_t{0},
                                                              std::uint64_t{0x9e3779b97f4a7c15})));

// Occurrence counts by pointer, as a sequence counts its members: zero marks a free slot.
TEST(FlatTable, CountsByPointerAgreeWithAStandardMap) {
  std::mt19937_64 random(7);
  const std::vector<int> objects(2000);
  qf::zero::internal::FlatTable<const int*, std::size_t> counts;
  std::unordered_map<const int*, std::size_t> expected;
  for (int step = 0; step < 60000; ++step) {
    const int* key = &objects[random() % objects.size()];
    std::size_t* count = counts.find(key);
    ASSERT_EQ(count != nullptr, expected.count(key) == 1) << "step " << step;
    if (random() % 2 == 0) {
      if (count != nullptr) {
        ++*count;
      } else {
        counts.tryInsert(key, 1);
      }
      ++expected[key];
    } else if (count != nullptr) {
      if (*count == 1) {
        ASSERT_TRUE(counts.erase(key));
      } else {
        --*count;
      }
      if (--expected[key] == 0) expected.erase(key);
    }
    ASSERT_EQ(counts.size(), expected.size());
  }
  for (const auto& [key, count] : expected) ASSERT_EQ(*counts.find(key), count);
}

// Erasing releases the handle only once the table is whole: the handle's end may read it.
TEST(FlatTable, AHandleReleasedByEraseMayReadTheTable) {
  Table table;
  for (std::uint32_t i = 0; i < 100; ++i) table.tryInsert(sequentialUuid(i), std::make_shared<int>(int(i)));
  std::size_t seenSize = 0;
  bool othersFound = true;
  auto probe = std::shared_ptr<int>(new int(-1), [&](int* p) {
    seenSize = table.size();
    for (std::uint32_t i = 0; i < 100; ++i)
      othersFound = othersFound && table.find(sequentialUuid(i)) != nullptr;
    delete p;
  });
  table.tryInsert(sequentialUuid(1000), std::move(probe));
  ASSERT_TRUE(table.erase(sequentialUuid(1000)));
  EXPECT_EQ(seenSize, 100u);
  EXPECT_TRUE(othersFound);
}

}  // namespace
