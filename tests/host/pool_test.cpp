// Pools in normal operation: tiers, zeros, alignment, accounts, ceilings, and what memory they cost.
#include <gtest/gtest.h>
#include <qxhost/qxhost.h>
#include <sys/resource.h>
#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <cstring>
#include <functional>
#include <limits>
#include <set>
#include <vector>

namespace {

constexpr std::uint64_t kMiB = std::uint64_t{1} << 20;
// Around every border between size classes and tiers.
const std::vector<std::uint64_t> kSizes = {0,    1,    15,   16,   17,     255,    256,    257,    320,  321,     1024,
                                           4095, 4096, 4097, 8192, 131071, 131072, 131073, 200000, kMiB, 5 * kMiB};

// Column `k` of the counts of the process's pages, in bytes: 0 mapped, 1 in memory.
std::int64_t bytes_of_pages(int k) {
  long counts[2] = {0, 0};
  std::FILE* statm = std::fopen("/proc/self/statm", "r");
  if (!statm) return -1;
  const int read = std::fscanf(statm, "%ld %ld", &counts[0], &counts[1]);
  std::fclose(statm);
  return read == 2 ? counts[k] * sysconf(_SC_PAGESIZE) : -1;
}
std::int64_t resident_bytes() { return bytes_of_pages(1); }
[[maybe_unused]] std::int64_t mapped_bytes() { return bytes_of_pages(0); }

class PoolTest : public ::testing::Test {
 protected:
  void SetUp() override {
    ASSERT_NE(host, nullptr);
    pool = create_pool();
    ASSERT_NE(pool, nullptr);
  }
  void TearDown() override { qxhost_destroy(host); }

  MemoryPool* create_pool() {
    HostServices* services = qxhost_services(host);
    const PoolParms parms = {SM_POOL_MATRIX, {0, 0}};
    return services->create_pool(services, &parms, nullptr, nullptr);
  }
  char* take(std::uint64_t bytes, std::uint32_t flags = 0) {
    return static_cast<char*>(pool->allocate(pool, bytes, flags));
  }
  // So many blocks, every page of them touched.
  std::vector<char*> take_written(int count, std::uint64_t bytes) {
    std::vector<char*> blocks;
    for (int k = 0; k < count; ++k) {
      blocks.push_back(take(bytes));
      EXPECT_NE(blocks.back(), nullptr);
      if (blocks.back()) std::memset(blocks.back(), 1, bytes);
    }
    return blocks;
  }
  QxHostUsage usage() { return qxhost_usage(host); }

  QxHost* host = qxhost_create(nullptr);
  MemoryPool* pool = nullptr;
};

bool all_equal(const char* block, std::uint64_t bytes, char value) {
  return std::all_of(block, block + bytes, [value](char c) { return c == value; });
}
bool all_zero(const char* block, std::uint64_t bytes) { return all_equal(block, bytes, 0); }

TEST_F(PoolTest, blocks_of_every_tier_are_aligned_and_hold_what_is_written_to_them) {
  std::vector<char*> blocks;
  for (std::size_t k = 0; k < kSizes.size(); ++k) {
    blocks.push_back(take(kSizes[k]));
    ASSERT_NE(blocks[k], nullptr) << kSizes[k];
    EXPECT_EQ(reinterpret_cast<std::uintptr_t>(blocks[k]) % 16, 0U) << kSizes[k];
    std::memset(blocks[k], static_cast<int>(k + 1), kSizes[k]);
  }
  for (std::size_t k = 0; k < kSizes.size(); ++k) {
    EXPECT_TRUE(all_equal(blocks[k], kSizes[k], static_cast<char>(k + 1))) << kSizes[k];
  }
}

TEST_F(PoolTest, a_zero_filled_block_is_zero_also_where_memory_is_used_again) {
  for (const std::uint64_t bytes : kSizes) {
    for (int round = 0; round < 3; ++round) {
      char* block = take(bytes, SM_POOL_ZERO);
      ASSERT_NE(block, nullptr) << bytes;
      EXPECT_TRUE(all_zero(block, bytes)) << bytes << " bytes, round " << round;
      std::memset(block, 0xFF, bytes);
      pool->free(pool, block);
    }
  }
}

TEST_F(PoolTest, a_freed_small_block_is_served_again_for_the_same_size_class) {
  char* first = take(100);
  pool->free(pool, first);
  EXPECT_EQ(take(112), first);
  EXPECT_NE(take(112), first);
}

TEST_F(PoolTest, requests_for_no_bytes_are_answered_with_distinct_blocks) {
  std::set<char*> blocks;
  for (int k = 0; k < 10; ++k) blocks.insert(take(0));
  EXPECT_EQ(blocks.size(), 10U);
  EXPECT_EQ(blocks.count(nullptr), 0U);
  EXPECT_EQ(usage().bytes_in_use, 0U);
}

TEST_F(PoolTest, sizes_that_nothing_can_hold_are_answered_with_null) {
  constexpr std::uint64_t kLargest = std::numeric_limits<std::uint64_t>::max();
  for (const std::uint64_t bytes : {kLargest, kLargest - 15, kLargest - 63, kLargest - 64, kLargest - 4159,
                                    kLargest / 2 + 1, std::uint64_t{1} << 60, std::uint64_t{1} << 47}) {
    EXPECT_EQ(take(bytes), nullptr) << bytes;
    EXPECT_EQ(take(bytes, SM_POOL_ZERO), nullptr) << bytes;
  }
  EXPECT_EQ(usage().bytes_in_use, 0U);
  EXPECT_EQ(usage().bytes_peak, 0U);
  EXPECT_EQ(qxhost_ceiling_was_met(host), 0);
}

TEST_F(PoolTest, freeing_null_is_harmless) {
  pool->free(pool, nullptr);
  EXPECT_EQ(usage().bytes_in_use, 0U);
}

TEST_F(PoolTest, usage_counts_requested_bytes_and_remembers_the_peak) {
  char* small = take(100);
  char* medium = take(10'000);
  char* large = take(kMiB);
  EXPECT_EQ(usage().bytes_in_use, 100 + 10'000 + kMiB);
  pool->free(pool, large);
  EXPECT_EQ(usage().bytes_in_use, 10'100U);
  pool->free(pool, small);
  pool->free(pool, medium);
  EXPECT_EQ(usage().bytes_in_use, 0U);
  take(50);
  EXPECT_EQ(usage().bytes_in_use, 50U);
  EXPECT_EQ(usage().bytes_peak, 100 + 10'000 + kMiB);
}

TEST_F(PoolTest, outside_the_checking_mode_blocks_and_requests_are_not_counted) {
  take(10);
  EXPECT_EQ(usage().blocks_live, 0);
  EXPECT_EQ(usage().requests, 0);
}

TEST_F(PoolTest, destroying_a_pool_gives_back_all_its_blocks_and_no_other) {
  MemoryPool* other = create_pool();
  auto* kept = static_cast<char*>(other->allocate(other, 1000, SM_POOL_ZERO));
  for (const std::uint64_t bytes : kSizes) {
    for (int k = 0; k < 20; ++k) ASSERT_NE(take(bytes), nullptr);
  }
  EXPECT_EQ(usage().pools_live, 2);
  pool->destroy(pool);
  EXPECT_EQ(usage().pools_live, 1);
  EXPECT_EQ(usage().bytes_in_use, 1000U);
  EXPECT_TRUE(all_zero(kept, 1000));
}

TEST_F(PoolTest, pools_go_in_any_order) {
  std::vector<MemoryPool*> pools;
  for (int k = 0; k < 5; ++k) pools.push_back(create_pool());
  for (const int k : {2, 0, 4, 3, 1}) pools[static_cast<std::size_t>(k)]->destroy(pools[static_cast<std::size_t>(k)]);
  EXPECT_EQ(usage().pools_live, 1);
  EXPECT_NE(take(64), nullptr);
}

TEST_F(PoolTest, large_blocks_are_freed_in_any_order) {
  std::vector<char*> blocks;
  for (int k = 0; k < 6; ++k) blocks.push_back(take(k % 2 == 0 ? kMiB : 9000, SM_POOL_ZERO));
  for (const std::size_t k : {3U, 0U, 5U, 2U}) pool->free(pool, blocks[k]);
  EXPECT_EQ(usage().bytes_in_use, kMiB + 9000);
  EXPECT_TRUE(all_zero(blocks[4], kMiB));
  EXPECT_TRUE(all_zero(blocks[1], 9000));
}

// One of the module's slabs of nodes at its largest.
TEST_F(PoolTest, a_slab_of_640_megabytes_that_is_not_touched_costs_no_memory) {
  const std::int64_t before = resident_bytes();
  char* zeroed = take(640 * kMiB, SM_POOL_ZERO);
  char* plain = take(640 * kMiB - 4096);  // with the page in front of it a whole number of huge pages
  ASSERT_NE(zeroed, nullptr);
  ASSERT_NE(plain, nullptr);
  ASSERT_GT(before, 0);
  EXPECT_LT(resident_bytes() - before, std::int64_t{kMiB} / 2);
  EXPECT_EQ(zeroed[0], 0);
  EXPECT_EQ(zeroed[320 * kMiB], 0);
  EXPECT_EQ(zeroed[640 * kMiB - 1], 0);
}

TEST_F(PoolTest, a_freed_block_of_more_than_32_megabytes_goes_back_to_the_system_at_once) {
  char* block = take(64 * kMiB);
  ASSERT_NE(block, nullptr);
  const std::int64_t before = resident_bytes();
  std::memset(block, 1, 64 * kMiB);
  EXPECT_GT(resident_bytes() - before, 60 * std::int64_t{kMiB});
  pool->free(pool, block);
  EXPECT_LT(resident_bytes() - before, 4 * std::int64_t{kMiB});
}

TEST_F(PoolTest, freed_pages_are_handed_out_again_to_any_pool_for_about_the_same_size) {
  char* first = take(3 * kMiB);
  pool->free(pool, first);
  EXPECT_NE(take(2 * kMiB), first);  // a third would lie idle
  EXPECT_NE(take(3 * kMiB + 4096), first);
  MemoryPool* other = create_pool();
  EXPECT_EQ(other->allocate(other, 3 * kMiB - 10'000, 0), first);
  EXPECT_NE(take(3 * kMiB), first);
}

TEST_F(PoolTest, of_kept_pages_the_smallest_that_will_do_are_taken) {
  std::vector<char*> blocks;
  for (const std::uint64_t size : {10U, 9U, 8U, 11U}) blocks.push_back(take(size * kMiB));
  for (char* block : blocks) pool->free(pool, block);
  EXPECT_EQ(take(9 * kMiB), blocks[1]);
  EXPECT_EQ(take(9 * kMiB), blocks[0]);
  EXPECT_EQ(take(9 * kMiB), blocks[3]);
}

// The bounds leave room for a sanitizer's shadow of them all.
TEST_F(PoolTest, of_freed_pages_64_megabytes_are_kept_and_the_oldest_go) {
  const std::int64_t before = resident_bytes();
  const std::vector<char*> blocks = take_written(12, 8 * kMiB);
  for (char* block : blocks) pool->free(pool, block);
  EXPECT_LT(resident_bytes() - before, 80 * std::int64_t{kMiB});
  EXPECT_GT(resident_bytes() - before, 60 * std::int64_t{kMiB});
  qxhost_trim(host);
  EXPECT_LT(resident_bytes() - before, 20 * std::int64_t{kMiB});
}

TEST_F(PoolTest, many_kept_blocks_do_not_grow_without_bound) {
  const std::int64_t before = resident_bytes();
  const std::vector<char*> blocks = take_written(200, kMiB / 4);
  for (char* block : blocks) pool->free(pool, block);
  EXPECT_LT(resident_bytes() - before, 20 * std::int64_t{kMiB});
  EXPECT_EQ(take(kMiB / 4, SM_POOL_ZERO)[kMiB / 8], 0);
}

TEST_F(PoolTest, a_large_zero_filled_block_costs_no_memory_also_after_others_were_used_and_freed) {
  char* block = take(20 * kMiB);
  std::memset(block, 1, 20 * kMiB);
  pool->free(pool, block);
  for (int round = 0; round < 4; ++round) {
    const std::int64_t before = resident_bytes();
    block = take(20 * kMiB, SM_POOL_ZERO);
    ASSERT_NE(block, nullptr);
    EXPECT_LT(resident_bytes() - before, std::int64_t{kMiB}) << "round " << round;
    std::memset(block, 1, 20 * kMiB);
    pool->free(pool, block);
  }
}

// Requests of one size that are met while the process may map only `more` bytes beyond what it has.
int served_within(std::uint64_t more, const std::function<char*()>& request) {
  rlimit before = {};
  rlimit tight = {};
  if (getrlimit(RLIMIT_AS, &before) != 0) return -1;
  tight = before;
  tight.rlim_cur = static_cast<rlim_t>(mapped_bytes()) + more;
  if (setrlimit(RLIMIT_AS, &tight) != 0) return -1;
  int served = 0;
  while (served < 100'000 && request()) ++served;
  return setrlimit(RLIMIT_AS, &before) == 0 ? served : -1;
}

TEST_F(PoolTest, kept_pages_make_way_when_address_space_is_short) {
  if (QXESM_SANITIZED) GTEST_SKIP() << "the sanitizer needs address space of its own";
  struct Case {
    std::uint64_t size;
    int fewest;  // of them that fit into the 60 MiB that are kept
  };
  for (const Case& c : {Case{50 * kMiB, 1}, Case{100'000, 500}, Case{4096, 12'000}}) {
    MemoryPool* fresh = create_pool();
    std::vector<char*> blocks;
    for (int k = 0; k < 3; ++k) blocks.push_back(take(20 * kMiB));
    for (char* block : blocks) pool->free(pool, block);
    const auto request = [&] { return static_cast<char*>(fresh->allocate(fresh, c.size, 0)); };
    EXPECT_GE(served_within(10 * kMiB, request), c.fewest) << c.size;
    fresh->destroy(fresh);
  }
}

TEST_F(PoolTest, sizes_that_are_powers_of_two_are_kept_up_to_the_limits) {
  char* block = take(32 * kMiB);
  pool->free(pool, block);
  EXPECT_EQ(take(32 * kMiB), block);
  std::vector<char*> blocks;
  for (int k = 0; k < 4; ++k) blocks.push_back(take(16 * kMiB));
  for (char* each : blocks) pool->free(pool, each);
  for (char* each : blocks) EXPECT_EQ(take(16 * kMiB), each);
  block = take(4 * kMiB, SM_POOL_ZERO);
  block[100] = 1;
  pool->free(pool, block);
  EXPECT_EQ(take(4 * kMiB, SM_POOL_ZERO), block);
  EXPECT_EQ(block[100], 0);
}

TEST_F(PoolTest, more_freed_pages_are_kept_when_the_host_is_told_so) {
  qxhost_set_kept_memory(host, 80 * kMiB);
  const std::int64_t before = resident_bytes();
  const std::vector<char*> blocks = take_written(3, 40 * kMiB);
  for (char* block : blocks) pool->free(pool, block);
  EXPECT_GT(resident_bytes() - before, 75 * std::int64_t{kMiB});
  EXPECT_LT(resident_bytes() - before, 90 * std::int64_t{kMiB});
  EXPECT_EQ(take(40 * kMiB), blocks[1]);
  EXPECT_EQ(take(40 * kMiB), blocks[2]);
}

TEST_F(PoolTest, lowering_what_may_wait_gives_the_oldest_pages_back_at_once) {
  qxhost_set_kept_memory(host, 60 * kMiB);
  const std::vector<char*> blocks = take_written(3, 20 * kMiB);
  for (char* block : blocks) pool->free(pool, block);
  const std::int64_t before = resident_bytes();
  qxhost_set_kept_memory(host, 45 * kMiB);
  EXPECT_LT(resident_bytes() - before, -15 * std::int64_t{kMiB});
  EXPECT_GT(resident_bytes() - before, -25 * std::int64_t{kMiB});
  qxhost_set_kept_memory(host, 0);
  EXPECT_LT(resident_bytes() - before, -55 * std::int64_t{kMiB});
  EXPECT_EQ(qxhost_usage(host).bytes_in_use, 0U);
}

TEST_F(PoolTest, pages_that_were_asked_for_many_zeros_are_not_kept) {
  const std::int64_t before = resident_bytes();
  for (int round = 0; round < 3; ++round) {
    char* block = take(20 * kMiB, SM_POOL_ZERO);
    std::memset(block, 1, 20 * kMiB);
    pool->free(pool, block);
  }
  EXPECT_LT(resident_bytes() - before, 8 * std::int64_t{kMiB});
}

TEST_F(PoolTest, past_the_hosts_ceiling_requests_are_answered_with_null) {
  qxhost_set_memory_ceiling(host, 10'000);
  MemoryPool* other = create_pool();
  char* first = take(6'000);
  ASSERT_NE(first, nullptr);
  EXPECT_EQ(qxhost_ceiling_was_met(host), 0);
  EXPECT_EQ(other->allocate(other, 4'001, 0), nullptr);
  EXPECT_NE(qxhost_ceiling_was_met(host), 0);
  EXPECT_NE(other->allocate(other, 4'000, 0), nullptr);
  EXPECT_EQ(take(1), nullptr);
  EXPECT_NE(take(0), nullptr);
  pool->free(pool, first);
  EXPECT_NE(take(6'000), nullptr);
  EXPECT_EQ(usage().bytes_peak, 10'000U);
}

TEST_F(PoolTest, a_destroyed_pool_makes_room_below_the_ceiling) {
  qxhost_set_memory_ceiling(host, 2 * kMiB);
  ASSERT_NE(take(2 * kMiB), nullptr);
  EXPECT_EQ(take(1), nullptr);
  pool->destroy(pool);
  pool = create_pool();
  EXPECT_NE(take(2 * kMiB), nullptr);
}

TEST_F(PoolTest, a_pools_own_ceiling_binds_that_pool_only) {
  MemoryPool* other = create_pool();
  ASSERT_EQ(qxhost_set_pool_ceiling(host, pool, 1'000), 0);
  EXPECT_EQ(take(1'001), nullptr);
  EXPECT_NE(qxhost_ceiling_was_met(host), 0);
  EXPECT_NE(take(1'000), nullptr);
  EXPECT_EQ(take(1), nullptr);
  EXPECT_NE(other->allocate(other, 5'000, 0), nullptr);
  ASSERT_EQ(qxhost_set_pool_ceiling(host, pool, 0), 0);
  EXPECT_NE(take(5'000), nullptr);
}

TEST_F(PoolTest, a_pool_of_another_host_gets_no_ceiling) {
  QxHost* stranger = qxhost_create(nullptr);
  ASSERT_NE(stranger, nullptr);
  EXPECT_EQ(qxhost_set_pool_ceiling(stranger, pool, 1), -1);
  EXPECT_EQ(qxhost_set_pool_ceiling(host, nullptr, 1), -1);
  EXPECT_NE(take(1'000), nullptr);
  qxhost_destroy(stranger);
}

TEST_F(PoolTest, a_ceiling_below_what_is_out_refuses_until_enough_came_back) {
  char* first = take(6'000);
  char* second = take(3'000);
  qxhost_set_memory_ceiling(host, 4'000);
  EXPECT_EQ(take(1), nullptr);
  pool->free(pool, first);
  EXPECT_EQ(take(1'001), nullptr);
  EXPECT_NE(take(1'000), nullptr);
  pool->free(pool, second);
  qxhost_set_memory_ceiling(host, 0);
  EXPECT_NE(take(kMiB), nullptr);
}

TEST_F(PoolTest, sizes_near_two_to_the_64_do_not_wrap_past_a_ceiling) {
  qxhost_set_memory_ceiling(host, 10'000);
  take(5'000);
  EXPECT_EQ(take(std::numeric_limits<std::uint64_t>::max() - 4'000), nullptr);
  EXPECT_NE(qxhost_ceiling_was_met(host), 0);
  EXPECT_EQ(usage().bytes_in_use, 5'000U);
}

TEST(Host, takes_its_ceiling_from_the_options) {
  const QxHostOptions options = {1'000, 0};
  QxHost* host = qxhost_create(&options);
  ASSERT_NE(host, nullptr);
  HostServices* services = qxhost_services(host);
  const PoolParms parms = {};
  MemoryPool* pool = services->create_pool(services, &parms, nullptr, nullptr);
  EXPECT_EQ(pool->allocate(pool, 1'001, 0), nullptr);
  EXPECT_NE(pool->allocate(pool, 1'000, 0), nullptr);
  qxhost_destroy(host);
}

TEST(Host, destroying_null_is_harmless_and_destroying_a_host_ends_its_pools) {
  qxhost_destroy(nullptr);
  const std::int64_t before = resident_bytes();
  QxHost* host = qxhost_create(nullptr);
  HostServices* services = qxhost_services(host);
  const PoolParms parms = {};
  for (int k = 0; k < 4; ++k) {
    MemoryPool* pool = services->create_pool(services, &parms, nullptr, nullptr);
    void* block = pool->allocate(pool, 16 * kMiB, 0);
    ASSERT_NE(block, nullptr);
    std::memset(block, 1, 16 * kMiB);
  }
  EXPECT_GT(resident_bytes() - before, 60 * std::int64_t{kMiB});
  qxhost_destroy(host);
  EXPECT_LT(resident_bytes() - before, 4 * std::int64_t{kMiB});
}

}  // namespace
