#include "qf/zero/core/saturated_bloom_filter.h"

#include <boost/uuid/uuid.hpp>

#include <gtest/gtest.h>

#include <cstdint>
#include <cstring>
#include <map>
#include <random>
#include <vector>

namespace {

using boost::uuids::uuid;
using qf::zero::SaturatedBloomFilter;

// Version-4 uuids drawn from a seeded generator, so failures reproduce.
uuid randomUuid(std::mt19937_64& random) {
  uuid id{};
  const std::uint64_t halves[2] = {random(), random()};
  std::memcpy(id.data, halves, sizeof halves);
  id.data[6] = static_cast<std::uint8_t>((id.data[6] & 0x0F) | 0x40);
  id.data[8] = static_cast<std::uint8_t>((id.data[8] & 0x3F) | 0x80);
  return id;
}

// Uuids that differ in a few low bytes only, as hand-made or sequential ids do.
uuid sequentialUuid(std::uint32_t n) {
  uuid id{};
  id.data[12] = static_cast<std::uint8_t>(n >> 24);
  id.data[13] = static_cast<std::uint8_t>(n >> 16);
  id.data[14] = static_cast<std::uint8_t>(n >> 8);
  id.data[15] = static_cast<std::uint8_t>(n);
  return id;
}

TEST(SaturatedBloomFilter, CountsRepeatedAddsUntilSaturated) {
  std::mt19937_64 random(1);
  const uuid x = randomUuid(random);
  const uuid y = randomUuid(random);

  SaturatedBloomFilter filter(100);
  EXPECT_FALSE(filter.contains(x));
  filter.add(x);
  filter.add(x);
  filter.remove(x);
  EXPECT_TRUE(filter.contains(x)) << "added twice, removed once";
  filter.remove(x);
  EXPECT_FALSE(filter.contains(x)) << "every counter is back to zero";

  // 300 adds saturate x's counters; no number of removes may then lose x.
  for (int i = 0; i < 300; ++i) filter.add(x);
  for (int i = 0; i < 300; ++i) filter.remove(x);
  EXPECT_TRUE(filter.contains(x));
  EXPECT_FALSE(filter.contains(y));
}

TEST(SaturatedBloomFilter, RemovingAnAbsentUuidLeavesTheFilterUnchanged) {
  std::mt19937_64 random(2);
  const uuid x = randomUuid(random);
  const uuid absent = randomUuid(random);

  SaturatedBloomFilter filter(100);
  filter.remove(absent);  // would wrap empty counters round to "saturated"
  EXPECT_FALSE(filter.contains(absent));
  filter.add(x);
  filter.remove(absent);
  EXPECT_TRUE(filter.contains(x));
  filter.remove(x);
  EXPECT_FALSE(filter.contains(x));
  EXPECT_FALSE(filter.contains(absent));
}

// A small filter far beyond its expected count saturates many counters and shares the rest, the
// situation in which a counting mistake would drop a member.
TEST(SaturatedBloomFilter, NeverMissesAMemberAcrossManyAddsAndRemoves) {
  const std::uint64_t seed = 0x5eed0001;
  std::mt19937_64 random(seed);
  SaturatedBloomFilter filter(16);
  std::vector<uuid> pool;
  for (int i = 0; i < 600; ++i) pool.push_back(randomUuid(random));
  std::map<uuid, int> members;  // uuid -> times added minus times removed

  for (int step = 0; step < 30000; ++step) {
    const uuid& id = pool[random() % pool.size()];
    if (random() % 3 != 0) {
      filter.add(id);
      ++members[id];
    } else if (auto it = members.find(id); it != members.end()) {
      filter.remove(id);
      if (--it->second == 0) members.erase(it);
    }
    if (step % 100 == 0) {
      for (const auto& [member, count] : members)
        ASSERT_TRUE(filter.contains(member)) << "seed " << seed << " step " << step;
    }
  }
  for (const auto& [member, count] : members) ASSERT_TRUE(filter.contains(member)) << "seed " << seed;
}

TEST(SaturatedBloomFilter, AfterRemovingEverythingAFreshFilterIsEmptyAgain) {
  // Without saturation, removing every add restores all counters: nothing may remain.
  const std::uint64_t seed = 0x5eed0002;
  std::mt19937_64 random(seed);
  SaturatedBloomFilter filter(1000);
  std::vector<uuid> ids;
  for (int i = 0; i < 1000; ++i) ids.push_back(randomUuid(random));
  for (const uuid& id : ids) filter.add(id);
  for (const uuid& id : ids) ASSERT_TRUE(filter.contains(id)) << "seed " << seed;
  for (const uuid& id : ids) filter.remove(id);
  int remaining = 0;
  for (const uuid& id : ids) remaining += filter.contains(id) ? 1 : 0;
  EXPECT_EQ(remaining, 0) << "seed " << seed;
}

// Sized for under 1% false positives at the expected count; the bound leaves room for chance.
TEST(SaturatedBloomFilter, FalsePositiveRateIsLowAtTheExpectedCount) {
  constexpr int expected = 10000;
  constexpr int probes = 100000;
  struct Case {
    const char* what;
    bool sequential;
  };
  for (const Case c : {Case{"random uuids", false}, Case{"sequential uuids", true}}) {
    const std::uint64_t seed = 0x5eed0003;
    std::mt19937_64 random(seed);
    SaturatedBloomFilter filter(expected);
    for (int i = 0; i < expected; ++i) filter.add(c.sequential ? sequentialUuid(i) : randomUuid(random));
    int falsePositives = 0;
    for (int i = 0; i < probes; ++i)
      falsePositives +=
          filter.contains(c.sequential ? sequentialUuid(expected + i) : randomUuid(random)) ? 1 : 0;
    const double rate = double(falsePositives) / probes;
    EXPECT_LT(rate, 0.015) << c.what << ", seed " << seed;
  }
}

TEST(SaturatedBloomFilter, ClearForgetsEverything) {
  std::mt19937_64 random(4);
  SaturatedBloomFilter filter;
  const uuid x = randomUuid(random);
  for (int i = 0; i < 20; ++i) filter.add(x);
  filter.clear();
  EXPECT_FALSE(filter.contains(x));
  filter.add(x);
  filter.remove(x);
  EXPECT_FALSE(filter.contains(x)) << "counters restart from zero, not from saturation";
}

}  // namespace
