// Planned faults: each kind of request, the k-th once or from then on, seen through the services.
#include <gtest/gtest.h>
#include <qxhost/qxhost.h>

#include <memory>
#include <string>
#include <vector>

namespace {

constexpr TreeParms kTreeParms = {1, 16, 10, 1};

class FaultTest : public ::testing::Test {
 protected:
  void SetUp() override {
    const QxHostOptions options = {0, 1};
    host = qxhost_create(&options);
    ASSERT_NE(host, nullptr);
    services = qxhost_services(host);
    pool = create_pool();
    ASSERT_NE(pool, nullptr);
  }
  void TearDown() override { qxhost_destroy(host); }

  MemoryPool* create_pool() {
    const PoolParms parms = {SM_POOL_MATRIX, {0, 0}};
    return services->create_pool(services, &parms, nullptr, nullptr);
  }
  TreeExtension* load_trees() {
    return static_cast<TreeExtension*>(services->load_extension(services, L"qxeavl", 6, nullptr));
  }
  // Whether each of `count` requests for a block is answered.
  std::vector<bool> blocks_answered(int count) {
    std::vector<bool> answered;
    for (int k = 0; k < count; ++k) answered.push_back(pool->allocate(pool, 8, 0) != nullptr);
    return answered;
  }

  QxHost* host = nullptr;
  HostServices* services = nullptr;
  MemoryPool* pool = nullptr;
};

using Answers = std::vector<bool>;

TEST_F(FaultTest, the_kth_block_is_refused_once) {
  for (int k = 0; k < 4; ++k) {
    qxhost_fail_request(host, QXHOST_FAIL_BLOCKS, k, 0);
    Answers want(5, true);
    want[static_cast<std::size_t>(k)] = false;
    EXPECT_EQ(blocks_answered(5), want) << k;
    EXPECT_EQ(qxhost_stop_failing(host), 1);
  }
}

TEST_F(FaultTest, from_the_kth_block_on_all_are_refused) {
  qxhost_fail_request(host, QXHOST_FAIL_BLOCKS, 2, 1);
  EXPECT_EQ(blocks_answered(5), (Answers{true, true, false, false, false}));
  EXPECT_EQ(qxhost_stop_failing(host), 3);
  EXPECT_EQ(blocks_answered(2), (Answers{true, true}));
  EXPECT_EQ(qxhost_stop_failing(host), 0);
}

TEST_F(FaultTest, a_fault_that_is_not_reached_refuses_nothing) {
  qxhost_fail_request(host, QXHOST_FAIL_ALL, 5, 1);
  EXPECT_EQ(blocks_answered(5), Answers(5, true));
  EXPECT_EQ(qxhost_stop_failing(host), 0);
  EXPECT_EQ(blocks_answered(2), Answers(2, true));
}

TEST_F(FaultTest, a_negative_k_plans_nothing) {
  qxhost_fail_request(host, QXHOST_FAIL_ALL, -1, 1);
  EXPECT_EQ(blocks_answered(3), Answers(3, true));
  EXPECT_EQ(qxhost_stop_failing(host), 0);
}

TEST_F(FaultTest, a_new_plan_takes_the_place_of_the_last_one) {
  qxhost_fail_request(host, QXHOST_FAIL_BLOCKS, 0, 1);
  EXPECT_EQ(blocks_answered(2), Answers(2, false));
  qxhost_fail_request(host, QXHOST_FAIL_BLOCKS, 1, 0);
  EXPECT_EQ(blocks_answered(3), (Answers{true, false, true}));
  EXPECT_EQ(qxhost_stop_failing(host), 1);
}

TEST_F(FaultTest, pools_are_refused_without_a_trace) {
  qxhost_fail_request(host, QXHOST_FAIL_POOLS, 1, 0);
  EXPECT_NE(create_pool(), nullptr);
  EXPECT_EQ(create_pool(), nullptr);
  EXPECT_NE(create_pool(), nullptr);
  EXPECT_EQ(qxhost_usage(host).pools_live, 3);
  EXPECT_EQ(qxhost_stop_failing(host), 1);
}

TEST_F(FaultTest, extension_loads_are_refused_with_an_error_line) {
  qxhost_fail_request(host, QXHOST_FAIL_EXTENSIONS, 0, 0);
  EXPECT_EQ(load_trees(), nullptr);
  EXPECT_EQ(std::string(qxhost_last_error(host)), "extension load: refused by the planned fault");
  EXPECT_EQ(qxhost_stop_failing(host), 1);
  TreeExtension* trees = load_trees();
  ASSERT_NE(trees, nullptr);
  trees->destroy(trees);
}

TEST_F(FaultTest, tree_managers_are_refused_and_the_next_is_a_working_one) {
  TreeExtension* trees = load_trees();
  ASSERT_NE(trees, nullptr) << qxhost_last_error(host);
  qxhost_fail_request(host, QXHOST_FAIL_TREES, 0, 0);
  EXPECT_EQ(trees->create_tree_manager(trees, &kTreeParms, nullptr, "Nonzero Tree"), nullptr);
  EXPECT_EQ(qxhost_stop_failing(host), 1);
  NonzeroTree* manager = trees->create_tree_manager(trees, &kTreeParms, nullptr, "Nonzero Tree");
  ASSERT_NE(manager, nullptr);
  std::uint64_t root = 0;
  NonzeroNode node = {0, 0, 5, 0.25};
  EXPECT_EQ(manager->insert(manager, &root, &node), &node);
  EXPECT_EQ(manager->first(manager, &root), &node);
  manager->destroy(manager);
  trees->destroy(trees);
}

TEST_F(FaultTest, only_the_kinds_that_are_named_are_counted_and_refused) {
  TreeExtension* trees = load_trees();
  ASSERT_NE(trees, nullptr) << qxhost_last_error(host);
  qxhost_fail_request(host, QXHOST_FAIL_POOLS | QXHOST_FAIL_EXTENSIONS, 1, 0);
  EXPECT_EQ(blocks_answered(3), Answers(3, true));
  EXPECT_NE(create_pool(), nullptr);
  EXPECT_EQ(blocks_answered(3), Answers(3, true));
  EXPECT_EQ(load_trees(), nullptr);
  EXPECT_EQ(qxhost_stop_failing(host), 1);
  trees->destroy(trees);
}

TEST_F(FaultTest, requests_of_the_tree_extension_itself_can_be_refused) {
  for (const std::int32_t what : {QXHOST_FAIL_POOLS, QXHOST_FAIL_BLOCKS}) {
    const std::int64_t pools = qxhost_usage(host).pools_live;
    const std::int64_t blocks = qxhost_usage(host).blocks_live;
    qxhost_fail_request(host, what, 0, 1);
    EXPECT_EQ(load_trees(), nullptr) << what;
    EXPECT_GT(qxhost_stop_failing(host), 0) << what;
    EXPECT_EQ(qxhost_usage(host).pools_live, pools);
    EXPECT_EQ(qxhost_usage(host).blocks_live, blocks);
  }
}

TEST_F(FaultTest, loads_by_the_program_itself_are_not_counted) {
  qxhost_fail_request(host, QXHOST_FAIL_EXTENSIONS, 0, 1);
  auto* trees = static_cast<TreeExtension*>(qxhost_load_extension(host, L"qxeavl", 6));
  EXPECT_NE(trees, nullptr) << qxhost_last_error(host);
  EXPECT_EQ(qxhost_stop_failing(host), 0);
  if (trees) trees->destroy(trees);
}

TEST_F(FaultTest, a_refused_block_counts_as_a_request_but_not_against_the_ceiling) {
  const std::int64_t requests = qxhost_usage(host).requests;
  qxhost_fail_request(host, QXHOST_FAIL_BLOCKS, 0, 0);
  blocks_answered(1);
  EXPECT_EQ(qxhost_usage(host).requests, requests + 1);
  EXPECT_EQ(qxhost_usage(host).bytes_in_use, 0U);
  EXPECT_EQ(qxhost_ceiling_was_met(host), 0);
}

TEST(Fault, outside_the_checking_mode_nothing_is_refused) {
  QxHost* host = qxhost_create(nullptr);
  ASSERT_NE(host, nullptr);
  HostServices* services = qxhost_services(host);
  const PoolParms parms = {};
  qxhost_fail_request(host, QXHOST_FAIL_ALL, 0, 1);
  MemoryPool* pool = services->create_pool(services, &parms, nullptr, nullptr);
  ASSERT_NE(pool, nullptr);
  EXPECT_NE(pool->allocate(pool, 8, 0), nullptr);
  EXPECT_EQ(qxhost_stop_failing(host), 0);
  qxhost_destroy(host);
}

}  // namespace
