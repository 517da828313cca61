// The minimal host itself: it counts what it should, and the module does to it what the contract says.
#include "support/minimal_host.h"

#include <gtest/gtest.h>
#include <qxesm/qxesm.h>

#include <cstring>
#include <limits>

#include "support/module_test.hpp"

namespace sm::test {
namespace {

// Unseen by AddressSanitizer: the host's own guard is under test.
[[gnu::no_sanitize("address"), gnu::noinline]] void write_unseen(volatile char* at, char value) { *at = value; }

class MinimalHostTest : public ::testing::Test {
 protected:
  void SetUp() override { ASSERT_NE(host, nullptr); }
  void TearDown() override { minimal_host_destroy(host); }

  HostServices* services() { return minimal_host_services(host); }
  MinimalHostCounts counts() { return minimal_host_counts(host); }
  MemoryPool* create_pool() {
    const PoolParms parms = {SM_POOL_MATRIX, {0, 0}};
    return services()->create_pool(services(), &parms, nullptr, nullptr);
  }

  MinimalHost* host = minimal_host_create();
};

TEST_F(MinimalHostTest, blocks_are_zeroed_on_demand_and_a_request_for_no_bytes_is_answered_with_null) {
  MemoryPool* pool = create_pool();
  auto* zeros = static_cast<char*>(pool->allocate(pool, 16, SM_POOL_ZERO));
  auto* plain = static_cast<char*>(pool->allocate(pool, 16, 0));
  EXPECT_EQ(std::string(zeros, 16), std::string(16, '\0'));
  EXPECT_EQ(std::string(plain, 16), std::string(16, 0x5A));
  EXPECT_EQ(pool->allocate(pool, 0, 0), nullptr);
  EXPECT_EQ(pool->allocate(pool, std::numeric_limits<std::uint64_t>::max() - 8, 0), nullptr);
  EXPECT_EQ(counts().live_blocks, 2);
  pool->destroy(pool);
  EXPECT_EQ(counts().live_blocks, 0);
  EXPECT_EQ(counts().live_pools, 0);
}

TEST_F(MinimalHostTest, mistakes_are_counted_and_none_crashes) {
  MemoryPool* pool = create_pool();
  MemoryPool* other = create_pool();
  char local = 0;
  auto* block = static_cast<char*>(pool->allocate(pool, 40, 0));
  pool->free(pool, nullptr);
  pool->free(pool, &local);
  other->free(other, block);
  EXPECT_EQ(counts().foreign_frees, 2);
  write_unseen(block + 40, 1);
  EXPECT_EQ(counts().overruns, 1);
  pool->free(pool, block);
  EXPECT_EQ(counts().overruns, 1);
  pool->free(pool, block);
  EXPECT_EQ(counts().double_frees, 1);
  pool->destroy(pool);
  pool->destroy(pool);
  EXPECT_EQ(pool->allocate(pool, 8, 0), nullptr);
  pool->free(pool, block);
  EXPECT_EQ(counts().dead_calls, 3);
  EXPECT_EQ(counts().bad_calls, 0);
}

TEST_F(MinimalHostTest, arguments_that_the_contract_does_not_know_are_counted) {
  const PoolParms odd = {2, {0, 0}};
  services()->create_pool(services(), &odd, nullptr, nullptr);
  EXPECT_EQ(counts().bad_calls, 1);
  const PoolParms parms = {SM_POOL_INSTANCE, {0, 0}};
  services()->create_pool(services(), &parms, nullptr, "OTHER");
  EXPECT_EQ(counts().bad_calls, 2);
  MemoryPool* pool = create_pool();
  pool->allocate(pool, 8, 1);
  EXPECT_EQ(counts().bad_calls, 3);
  EXPECT_EQ(services()->load_extension(services(), L"other", 5, nullptr), nullptr);
  EXPECT_EQ(counts().bad_calls, 4);
  auto* trees = static_cast<TreeExtension*>(services()->load_extension(services(), L"qxeavl", 6, nullptr));
  ASSERT_NE(trees, nullptr);
  const TreeParms shifted = {1, 8, 10, 1};
  trees->create_tree_manager(trees, &shifted, nullptr, "Nonzero Tree");
  EXPECT_EQ(counts().bad_calls, 5);
  pool->reserved_1[0] = pool;
  pool->destroy(pool);
  EXPECT_EQ(counts().bad_calls, 6);
}

TEST_F(MinimalHostTest, the_kth_request_of_any_kind_is_refused_once_or_from_then_on) {
  MemoryPool* pool = create_pool();
  minimal_host_fail_request(host, 1, 0);
  EXPECT_NE(pool->allocate(pool, 8, 0), nullptr);
  EXPECT_EQ(create_pool(), nullptr);
  EXPECT_NE(create_pool(), nullptr);
  EXPECT_EQ(minimal_host_stop_failing(host), 1);
  minimal_host_fail_request(host, 0, 1);
  EXPECT_EQ(pool->allocate(pool, 8, 0), nullptr);
  EXPECT_EQ(services()->load_extension(services(), L"qxeavl", 6, nullptr), nullptr);
  EXPECT_EQ(minimal_host_stop_failing(host), 2);
  auto* trees = static_cast<TreeExtension*>(services()->load_extension(services(), L"qxeavl", 6, nullptr));
  ASSERT_NE(trees, nullptr);
  const TreeParms parms = {1, 16, 10, 1};
  minimal_host_fail_request(host, 0, 0);
  EXPECT_EQ(trees->create_tree_manager(trees, &parms, nullptr, "Nonzero Tree"), nullptr);
  EXPECT_EQ(minimal_host_stop_failing(host), 1);
}

TEST_F(MinimalHostTest, a_manager_whose_inner_object_is_skipped_or_misused_is_a_mistake) {
  auto* trees = static_cast<TreeExtension*>(services()->load_extension(services(), L"qxeavl", 6, nullptr));
  ASSERT_NE(trees, nullptr);
  const TreeParms parms = {1, 16, 10, 1};
  const auto create = [&] { return trees->create_tree_manager(trees, &parms, nullptr, "Nonzero Tree"); };
  NonzeroTree* skipped = create();
  skipped->destroy(skipped);
  EXPECT_EQ(counts().inner_mistakes, 1);
  NonzeroTree* not_cleared = create();
  not_cleared->inner->reset(not_cleared->inner, 1, 1);
  not_cleared->inner->release(not_cleared->inner);
  EXPECT_EQ(counts().inner_mistakes, 2);
  not_cleared->destroy(not_cleared);
  NonzeroTree* wrong_arguments = create();
  wrong_arguments->inner->reset(wrong_arguments->inner, 1, 0);
  EXPECT_EQ(counts().inner_mistakes, 3);
  NonzeroTree* right = create();
  right->inner->reset(right->inner, 1, 1);
  right->cleared_word = nullptr;
  right->inner->release(right->inner);
  right->destroy(right);
  EXPECT_EQ(counts().inner_mistakes, 3);
  EXPECT_EQ(counts().inner_clears, 1);
}

// The module linked into this program, inside the minimal host.
class ModuleInMinimalHost : public MinimalHostTest {
 protected:
  void SetUp() override {
    MinimalHostTest::SetUp();
    std::int32_t major = 0;
    std::int32_t minor = 0;
    ASSERT_EQ(qxextver(services(), &major, &minor), 0);
    extension = qxesm(nullptr, nullptr);
    ASSERT_NE(extension, nullptr);
    instance = CreateInstance(extension);
    ASSERT_NE(instance, nullptr);
  }

  SmExtension* extension = nullptr;
  SmInstance* instance = nullptr;
};

TEST_F(ModuleInMinimalHost, an_instance_lives_in_its_workpool) {
  EXPECT_EQ(counts().workpools, 1);
  EXPECT_EQ(counts().live_pools, 2);
  qxsmDestroyInstance(&instance);
  EXPECT_EQ(counts().live_pools, 1);
  qxsmDestroyExtension(extension);
  EXPECT_EQ(counts().live_pools, 0);
  EXPECT_EQ(counts().live_extensions, 0);
  EXPECT_EQ(counts().bad_calls + counts().dead_calls, 0);
}

TEST_F(ModuleInMinimalHost, each_managers_inner_object_is_reset_cleared_and_released_before_it_goes) {
  for (const std::int32_t kind : {SM_KIND_GENERAL, SM_KIND_SYMMETRIC}) {
    SmMatrix* matrix = nullptr;
    ASSERT_EQ(qxsmnew(instance, &matrix, kind, SM_FORMAT_SPARSE), SM_OK);
  }
  EXPECT_EQ(counts().live_trees, 2);
  SmMatrix* first = instance->registry[0];
  ASSERT_EQ(qxsmdelete(first), SM_OK);
  EXPECT_EQ(counts().live_trees, 1);
  EXPECT_EQ(counts().inner_resets, 1);
  EXPECT_EQ(counts().inner_clears, 1);
  EXPECT_EQ(counts().inner_releases, 1);
  qxsmDestroyInstance(&instance);
  EXPECT_EQ(counts().inner_resets, 2);
  EXPECT_EQ(counts().inner_clears, 2);
  EXPECT_EQ(counts().inner_releases, 2);
  EXPECT_EQ(counts().live_trees, 0);
  EXPECT_EQ(counts().inner_mistakes, 0);
  qxsmDestroyExtension(extension);
  EXPECT_EQ(counts().bad_calls, 0);
}

// The fixture of all suites, under both hosts.
class BothHosts : public ModuleTest {};

TEST_P(BothHosts, a_small_system_is_assembled_factored_and_solved) {
  SmMatrix* a = nullptr;
  ASSERT_EQ(fn().qxsmnewss(instance(), &a, 3), SM_OK);
  for (std::int64_t i = 0; i < 3; ++i) ASSERT_EQ(fn().qxsmassign(a, i, i, 0, 2.0), SM_OK);
  for (std::int64_t i = 0; i < 2; ++i) ASSERT_EQ(fn().qxsmassign(a, i, i + 1, 1, -1.0), SM_OK);
  ASSERT_EQ(fn().qxsmclose(a, 0.0), SM_OK);
  ASSERT_EQ(fn().qxsmfact(a, 0), SM_OK);
  const double b[3] = {0.0, 0.0, 4.0};
  double x[3] = {};
  ASSERT_EQ(fn().qxsmsubst(a, b, x, 1), SM_OK);
  for (int i = 0; i < 3; ++i) EXPECT_NEAR(x[i], i + 1, 1e-14);
}

TEST_P(BothHosts, live_counts_and_faults_reach_what_the_module_asks_for) {
  EXPECT_GE(host().live_pools(), 2);
  const std::int64_t blocks = host().live_blocks();
  host().fail_request(0, false);
  SmMatrix* a = nullptr;
  EXPECT_EQ(fn().qxsmnew(instance(), &a, SM_KIND_GENERAL, SM_FORMAT_COLUMNS), SM_NO_MEMORY);
  EXPECT_EQ(a, nullptr);
  EXPECT_EQ(host().stop_failing(), 1);
  EXPECT_EQ(host().live_blocks(), blocks);
  EXPECT_EQ(fn().qxsmnew(instance(), &a, SM_KIND_GENERAL, SM_FORMAT_COLUMNS), SM_OK);
  EXPECT_GT(host().live_blocks(), blocks);
}

INSTANTIATE_BOTH_HOSTS(BothHosts);

}  // namespace
}  // namespace sm::test
