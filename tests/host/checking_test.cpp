// The checking mode: every kind of mistake is counted, none crashes, and correct use counts nothing.
#include <gtest/gtest.h>
#include <qxhost/qxhost.h>

#include <cstring>
#include <limits>
#include <vector>

namespace {

// Writes where the program may not, unseen by AddressSanitizer: the host's own guard is under test.
[[gnu::no_sanitize("address"), gnu::noinline]] void write_unseen(volatile char* at, char value) { *at = value; }

class CheckingTest : public ::testing::Test {
 protected:
  void SetUp() override {
    const QxHostOptions options = {0, 1};
    host = qxhost_create(&options);
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
  QxHostUsage usage() { return qxhost_usage(host); }
  // Foreign frees, double frees, overruns, calls on dead pools.
  std::vector<std::int64_t> found() {
    const QxHostViolations v = qxhost_violations(host);
    return {v.foreign_frees, v.double_frees, v.overruns, v.dead_pools};
  }

  QxHost* host = nullptr;
  MemoryPool* pool = nullptr;
};

using Found = std::vector<std::int64_t>;

TEST_F(CheckingTest, correct_use_counts_nothing) {
  for (const std::uint64_t bytes : {0U, 1U, 100U, 5000U, 300'000U}) {
    char* block = take(bytes);
    ASSERT_NE(block, nullptr);
    EXPECT_EQ(reinterpret_cast<std::uintptr_t>(block) % 16, 0U);
    std::memset(block, 0x11, bytes);
    pool->free(pool, block);
    ASSERT_NE(take(bytes, SM_POOL_ZERO), nullptr);
  }
  pool->free(pool, nullptr);
  pool->destroy(pool);
  EXPECT_EQ(found(), (Found{0, 0, 0, 0}));
  EXPECT_EQ(usage().blocks_live, 0);
  EXPECT_EQ(usage().pools_live, 0);
  EXPECT_EQ(usage().bytes_in_use, 0U);
}

TEST_F(CheckingTest, live_blocks_pools_and_requests_are_counted) {
  char* first = take(10);
  take(20);
  create_pool();
  EXPECT_EQ(usage().blocks_live, 2);
  EXPECT_EQ(usage().pools_live, 2);
  EXPECT_EQ(usage().requests, 4);
  EXPECT_EQ(usage().bytes_in_use, 30U);
  pool->free(pool, first);
  EXPECT_EQ(usage().blocks_live, 1);
  EXPECT_EQ(usage().bytes_in_use, 20U);
  EXPECT_EQ(usage().requests, 4);
}

TEST_F(CheckingTest, zero_filled_blocks_are_zero_and_others_visibly_are_not) {
  for (int round = 0; round < 3; ++round) {
    char* zeros = take(5000, SM_POOL_ZERO);
    char* plain = take(5000);
    ASSERT_NE(zeros, nullptr);
    ASSERT_NE(plain, nullptr);
    EXPECT_EQ(std::vector<char>(zeros, zeros + 5000), std::vector<char>(5000, 0));
    EXPECT_EQ(std::vector<char>(plain, plain + 5000), std::vector<char>(5000, static_cast<char>(0xCB)));
    std::memset(zeros, 0x22, 5000);
    pool->free(pool, zeros);
    pool->free(pool, plain);
  }
}

TEST_F(CheckingTest, freeing_what_was_never_handed_out_is_a_foreign_free) {
  char local = 0;
  char* block = take(100);
  pool->free(pool, &local);
  pool->free(pool, block + 16);
  EXPECT_EQ(found(), (Found{2, 0, 0, 0}));
  EXPECT_EQ(usage().blocks_live, 1);
}

TEST_F(CheckingTest, freeing_into_another_pool_is_a_foreign_free_and_leaves_the_block_alone) {
  char* block = take(100, SM_POOL_ZERO);
  MemoryPool* other = create_pool();
  other->free(other, block);
  EXPECT_EQ(found(), (Found{1, 0, 0, 0}));
  std::memset(block, 0x33, 100);
  EXPECT_EQ(usage().blocks_live, 1);
  pool->free(pool, block);
  EXPECT_EQ(found(), (Found{1, 0, 0, 0}));
}

TEST_F(CheckingTest, freeing_twice_is_a_double_free) {
  char* block = take(100);
  pool->free(pool, block);
  pool->free(pool, block);
  pool->free(pool, block);
  EXPECT_EQ(found(), (Found{0, 2, 0, 0}));
  EXPECT_EQ(usage().blocks_live, 0);
  EXPECT_EQ(usage().bytes_in_use, 0U);
}

TEST_F(CheckingTest, freeing_what_went_with_its_pool_is_a_double_free) {
  char* block = take(100);
  MemoryPool* other = create_pool();
  pool->destroy(pool);
  other->free(other, block);
  EXPECT_EQ(found(), (Found{0, 1, 0, 0}));
}

TEST_F(CheckingTest, a_write_past_the_end_is_found_in_a_live_block_and_counted_once) {
  for (const std::uint64_t bytes : {0U, 1U, 24U, 4096U}) {
    const std::int64_t before = qxhost_violations(host).overruns;
    char* block = take(bytes);
    write_unseen(block + bytes, 0x44);
    EXPECT_EQ(qxhost_violations(host).overruns, before + 1) << bytes;
    EXPECT_EQ(qxhost_violations(host).overruns, before + 1) << bytes;
    pool->free(pool, block);
    EXPECT_EQ(qxhost_violations(host).overruns, before + 1) << bytes;
  }
  EXPECT_EQ(found(), (Found{0, 0, 4, 0}));
}

TEST_F(CheckingTest, a_write_past_the_end_is_found_when_the_block_is_freed) {
  char* block = take(40);
  write_unseen(block + 40, 0x44);
  pool->free(pool, block);
  EXPECT_EQ(found(), (Found{0, 0, 1, 0}));
}

TEST_F(CheckingTest, a_write_past_the_end_is_found_when_the_pool_is_destroyed) {
  take(40);
  char* block = take(40);
  write_unseen(block + 40 + 63, 0x44);
  pool->destroy(pool);
  EXPECT_EQ(found(), (Found{0, 0, 1, 0}));
}

TEST_F(CheckingTest, an_address_that_is_served_again_is_judged_anew) {
  char* block = take(40);
  write_unseen(block + 40, 0x44);
  pool->free(pool, block);
  for (int k = 0; k < 1000; ++k) {
    char* again = take(40);
    pool->free(pool, again);
    ASSERT_EQ(found(), (Found{0, 0, 1, 0}));
  }
}

TEST_F(CheckingTest, calls_on_a_destroyed_pool_are_counted_and_answered_without_harm) {
  char* block = take(100);
  pool->destroy(pool);
  EXPECT_EQ(pool->allocate(pool, 10, 0), nullptr);
  pool->free(pool, block);
  pool->destroy(pool);
  EXPECT_EQ(found(), (Found{0, 0, 0, 3}));
  EXPECT_EQ(usage().pools_live, 0);
  EXPECT_EQ(qxhost_set_pool_ceiling(host, pool, 1), -1);
}

TEST_F(CheckingTest, calls_on_a_destroyed_tree_extension_are_counted) {
  auto* trees = static_cast<TreeExtension*>(qxhost_load_extension(host, L"qxeavl", 6));
  ASSERT_NE(trees, nullptr) << qxhost_last_error(host);
  trees->destroy(trees);
  trees->destroy(trees);
  const TreeParms parms = {1, 16, 10, 1};
  EXPECT_EQ(trees->create_tree_manager(trees, &parms, nullptr, "Nonzero Tree"), nullptr);
  EXPECT_EQ(found(), (Found{0, 0, 0, 2}));
}

TEST_F(CheckingTest, ceilings_hold_as_in_normal_operation) {
  qxhost_set_memory_ceiling(host, 1'000);
  EXPECT_EQ(take(1'001), nullptr);
  EXPECT_NE(take(1'000), nullptr);
  EXPECT_EQ(take(1), nullptr);
  EXPECT_NE(qxhost_ceiling_was_met(host), 0);
  EXPECT_EQ(take(std::numeric_limits<std::uint64_t>::max()), nullptr);
  EXPECT_EQ(usage().blocks_live, 1);
}

TEST_F(CheckingTest, sizes_near_two_to_the_64_are_answered_with_null) {
  for (const std::uint64_t less : {0U, 1U, 63U, 64U, 65U}) {
    EXPECT_EQ(take(std::numeric_limits<std::uint64_t>::max() - less, SM_POOL_ZERO), nullptr);
  }
  EXPECT_EQ(usage().blocks_live, 0);
}

TEST_F(CheckingTest, many_blocks_are_told_apart) {
  std::vector<char*> blocks;
  for (int k = 0; k < 20'000; ++k) blocks.push_back(take(8 + static_cast<std::uint64_t>(k) % 100));
  for (std::size_t k = 0; k < blocks.size(); k += 2) pool->free(pool, blocks[k]);
  EXPECT_EQ(usage().blocks_live, 10'000);
  EXPECT_EQ(found(), (Found{0, 0, 0, 0}));
  for (std::size_t k = 0; k < blocks.size(); k += 2) pool->free(pool, blocks[k]);
  EXPECT_EQ(found(), (Found{0, 10'000, 0, 0}));
}

TEST_F(CheckingTest, the_last_million_freed_blocks_are_remembered) {
  constexpr std::size_t kRemembered = std::size_t{1} << 20;
  std::vector<char*> blocks;
  for (std::size_t k = 0; k < kRemembered + 5; ++k) blocks.push_back(take(1));
  for (char* block : blocks) pool->free(pool, block);
  for (const std::size_t k : {std::size_t{0}, std::size_t{4}}) pool->free(pool, blocks[k]);
  EXPECT_EQ(found(), (Found{2, 0, 0, 0}));
  for (const std::size_t k : {std::size_t{5}, kRemembered + 4}) pool->free(pool, blocks[k]);
  EXPECT_EQ(found(), (Found{2, 2, 0, 0}));
}

TEST(Checking, many_dead_pools_are_let_go_from_the_oldest_on) {
  const QxHostOptions options = {0, 1};
  QxHost* host = qxhost_create(&options);
  HostServices* services = qxhost_services(host);
  const PoolParms parms = {};
  MemoryPool* last = nullptr;
  for (int k = 0; k < 70'000; ++k) {
    last = services->create_pool(services, &parms, nullptr, nullptr);
    ASSERT_NE(last, nullptr);
    last->destroy(last);
  }
  last->destroy(last);
  EXPECT_EQ(qxhost_violations(host).dead_pools, 1);
  EXPECT_EQ(qxhost_usage(host).pools_live, 0);
  qxhost_destroy(host);
}

TEST(Checking, a_host_that_ends_with_live_blocks_leaks_nothing_itself) {
  const QxHostOptions options = {0, 1};
  QxHost* host = qxhost_create(&options);
  HostServices* services = qxhost_services(host);
  const PoolParms parms = {};
  MemoryPool* pool = services->create_pool(services, &parms, nullptr, nullptr);
  EXPECT_NE(pool->allocate(pool, 100, 0), nullptr);
  EXPECT_EQ(qxhost_usage(host).blocks_live, 1);
  qxhost_destroy(host);  // LeakSanitizer looks at the end of the program
}

TEST(Checking, outside_the_mode_violations_are_all_zero) {
  QxHost* host = qxhost_create(nullptr);
  const QxHostViolations v = qxhost_violations(host);
  EXPECT_EQ(v.foreign_frees + v.double_frees + v.overruns + v.dead_pools, 0);
  qxhost_destroy(host);
}

#if defined(__SANITIZE_ADDRESS__)
using CheckingDeathTest = CheckingTest;

TEST_F(CheckingDeathTest, address_sanitizer_sees_the_first_byte_past_a_block) {
  volatile char* block = take(40);
  EXPECT_DEATH(block[40] = 1, "AddressSanitizer: use-after-poison");
}

TEST_F(CheckingDeathTest, address_sanitizer_sees_the_last_byte_before_a_block) {
  volatile char* block = take(40);
  EXPECT_DEATH(block[-1] = 1, "AddressSanitizer: heap-buffer-overflow");
}

TEST_F(CheckingDeathTest, address_sanitizer_sees_the_use_of_a_freed_block) {
  volatile char* block = take(40);
  pool->free(pool, const_cast<char*>(block));
  EXPECT_DEATH(block[0] = 1, "AddressSanitizer: heap-use-after-free");
}
#endif

}  // namespace
