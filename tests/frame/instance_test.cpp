#include <gtest/gtest.h>

#include <array>
#include <cstring>
#include <utility>
#include <vector>

#include "frame/recorded_test.hpp"

namespace sm::test {
namespace {

class Instance : public RecordedTest {
 protected:
  void SetUp() override {
    RecordedTest::SetUp();
    start();
  }

  const SmFunctionTable& fn() { return *instance_->functions; }

  SmMatrix* typed(int32_t kind, int32_t format) {
    SmMatrix* matrix = nullptr;
    EXPECT_EQ(fn().qxsmnew(instance_, &matrix, kind, format), SM_OK);
    return matrix;
  }
};

std::uint64_t bits(double value) {
  std::uint64_t out = 0;
  std::memcpy(&out, &value, sizeof out);
  return out;
}

TEST_P(Instance, begins_without_matrices_and_with_the_extensions_trees) {
  EXPECT_EQ(instance_->matrix_count, 0);
  EXPECT_EQ(instance_->matrix_capacity, 0);
  EXPECT_EQ(instance_->registry, nullptr);
  EXPECT_NE(instance_->pool, nullptr);
  EXPECT_EQ(instance_->tree_extension, extension_->tree_extension);
  ASSERT_NE(instance_->spare_word, nullptr);
  EXPECT_EQ(*instance_->spare_word, 0);
  EXPECT_NE(instance_->functions, nullptr);
}

TEST_P(Instance, writes_the_four_settings_to_the_bit) {
  ASSERT_NE(instance_->tolerances, nullptr);
  for (int k = 0; k < 3; ++k) EXPECT_EQ(bits(instance_->tolerances[k]), UINT64_C(0x3D73880000000002)) << k;
  EXPECT_EQ(bits(instance_->tolerances[3]), UINT64_C(0x20000000002302AC));
}

TEST_P(Instance, takes_everything_from_a_pool_named_workpool) {
  ASSERT_EQ(record().pools.size(), 2U);
  const PoolRequest& pool = record().pools[1];
  EXPECT_EQ(pool.parms.flag, SM_POOL_INSTANCE);
  EXPECT_EQ(pool.parms.reserved[0], 0U);
  EXPECT_EQ(pool.parms.reserved[1], 0U);
  EXPECT_EQ(pool.owner, nullptr);
  EXPECT_EQ(pool.name, "WORKPOOL");
}

TEST_P(Instance, asks_for_clear_blocks_padded_by_two_words) {
  // The first block is the extension object's.
  ASSERT_EQ(record().blocks.size(), 5U);
  const std::array<std::uint64_t, 4> bytes = {64, 344 + 16, 8 + 16, 32 + 16};
  for (std::size_t k = 0; k < bytes.size(); ++k) {
    EXPECT_EQ(record().blocks[k + 1].bytes, bytes[k]) << k;
    EXPECT_EQ(record().blocks[k + 1].flags, SM_POOL_ZERO) << k;
  }
}

TEST_P(Instance, made_without_an_extension_has_no_trees) {
  SmInstance* alone = nullptr;
  ASSERT_EQ(qxsmGetANewInstance(&alone), SM_OK);
  EXPECT_EQ(alone->tree_extension, nullptr);
  EXPECT_NE(alone->functions, nullptr);
  EXPECT_EQ(qxsmDestroyInstance(&alone), SM_OK);
  EXPECT_EQ(alone, nullptr);
}

TEST_P(Instance, without_a_pool_or_a_record_answers_101_and_null) {
  for (std::int64_t k : {0, 1}) {
    const std::int64_t pools = host_->live_pools();
    SmInstance* made = instance_;  // anything but null
    host_->fail_request(k, false);
    EXPECT_EQ(qxsmGetANewInstance(&made), SM_NO_MEMORY) << k;
    EXPECT_EQ(host_->stop_failing(), 1);
    EXPECT_EQ(made, nullptr);
    EXPECT_EQ(host_->live_pools(), pools);
  }
}

TEST_P(Instance, without_a_block_answers_100_and_the_half_built_instance) {
  for (std::int64_t k : {2, 3, 4}) {
    const std::int64_t pools = host_->live_pools();
    SmInstance* made = nullptr;
    host_->fail_request(k, false);
    EXPECT_EQ(qxsmGetANewInstance(&made), SM_NOTHING_TO_REPORT) << k;
    EXPECT_EQ(host_->stop_failing(), 1);
    ASSERT_NE(made, nullptr) << k;
    EXPECT_EQ(host_->live_pools(), pools + 1);
    EXPECT_NE(made->pool, nullptr);
    EXPECT_EQ(qxsmDestroyInstance(&made), SM_OK);
    EXPECT_EQ(made, nullptr);
    EXPECT_EQ(host_->live_pools(), pools);
  }
}

TEST_P(Instance, creation_through_the_extension_leaves_nothing_half_built) {
  for (const bool for_ever : {false, true}) {
    for (std::int64_t k = 0;; ++k) {
      const std::int64_t pools = host_->live_pools();
      const std::int64_t blocks = host_->live_blocks();
      host_->fail_request(k, for_ever);
      SmInstance* made = extension_->CreateInstance(extension_);
      if (host_->stop_failing() == 0) {
        EXPECT_EQ(k, 5) << "a pool, the instance and three blocks";
        ASSERT_NE(made, nullptr);
        EXPECT_EQ(qxsmDestroyInstance(&made), SM_OK);
        break;
      }
      EXPECT_EQ(made, nullptr) << "request " << k;
      EXPECT_EQ(host_->live_pools(), pools) << "request " << k;
      EXPECT_EQ(host_->live_blocks(), blocks) << "request " << k;
    }
  }
}

TEST_P(Instance, destroying_no_instance_is_harmless) {
  SmInstance* none = nullptr;
  EXPECT_EQ(qxsmDestroyInstance(&none), SM_OK);
  EXPECT_EQ(fn().qxsmDestroyInstance(&none), SM_OK);
}

TEST_P(Instance, the_registry_grows_by_ten) {
  std::vector<SmMatrix*> made;
  for (std::int64_t count = 1; count <= 31; ++count) {
    made.push_back(typed(SM_KIND_DIAGONAL, SM_FORMAT_ROWS));
    EXPECT_EQ(instance_->matrix_count, count);
    EXPECT_EQ(instance_->matrix_capacity, (count + 9) / 10 * 10) << count;
    EXPECT_EQ(made.back()->registry_index, count);
    EXPECT_EQ(made.back()->instance, instance_);
    for (std::int64_t k = 0; k < count; ++k) {
      ASSERT_EQ(instance_->registry[k], made[static_cast<std::size_t>(k)]) << count << ' ' << k;
    }
    for (std::int64_t k = count; k < instance_->matrix_capacity; ++k) ASSERT_EQ(instance_->registry[k], nullptr) << k;
  }
}

TEST_P(Instance, a_grown_registry_gives_the_old_one_back) {
  for (int k = 0; k < 10; ++k) typed(SM_KIND_DIAGONAL, SM_FORMAT_ROWS);
  const std::int64_t blocks = host_->live_blocks();
  typed(SM_KIND_DIAGONAL, SM_FORMAT_ROWS);
  const std::int64_t with_growth = host_->live_blocks() - blocks;
  typed(SM_KIND_DIAGONAL, SM_FORMAT_ROWS);
  EXPECT_EQ(host_->live_blocks() - blocks, 2 * with_growth);
}

TEST_P(Instance, a_registry_that_cannot_grow_answers_101_and_stays_whole) {
  std::vector<SmMatrix*> made;
  for (int k = 0; k < 10; ++k) made.push_back(typed(SM_KIND_DIAGONAL, SM_FORMAT_ROWS));
  const std::int64_t blocks = host_->live_blocks();
  const std::int64_t pools = host_->live_pools();
  SmMatrix* refused = nullptr;
  host_->fail_request(1, false);  // the record is there, the larger registry is not
  EXPECT_EQ(fn().qxsmnew(instance_, &refused, SM_KIND_DIAGONAL, SM_FORMAT_ROWS), SM_NO_MEMORY);
  EXPECT_EQ(host_->stop_failing(), 1);
  EXPECT_EQ(refused, nullptr);
  EXPECT_EQ(instance_->matrix_count, 10);
  EXPECT_EQ(instance_->matrix_capacity, 10);
  EXPECT_EQ(host_->live_blocks(), blocks);
  EXPECT_EQ(host_->live_pools(), pools);
  for (std::size_t k = 0; k < 10; ++k) EXPECT_EQ(instance_->registry[k], made[k]);
  EXPECT_EQ(typed(SM_KIND_DIAGONAL, SM_FORMAT_ROWS)->registry_index, 11);
}

TEST_P(Instance, slots_are_never_given_to_another_record) {
  SmMatrix* first = typed(SM_KIND_GENERAL, SM_FORMAT_SPARSE);
  SmMatrix* second = typed(SM_KIND_GENERAL, SM_FORMAT_SPARSE);
  ASSERT_EQ(fn().qxsmDestroyMatrix(instance_, &first), SM_OK);
  EXPECT_EQ(instance_->registry[0], nullptr);
  EXPECT_EQ(instance_->registry[1], second);
  EXPECT_EQ(instance_->matrix_count, 2);
  EXPECT_EQ(typed(SM_KIND_GENERAL, SM_FORMAT_SPARSE)->registry_index, 3);
  EXPECT_EQ(instance_->registry[0], nullptr);
}

TEST_P(Instance, destruction_resets_every_matrix_that_is_left) {
  const std::vector<std::pair<int32_t, int32_t>> shapes = {
      {SM_KIND_GENERAL, SM_FORMAT_SPARSE},    {SM_KIND_GENERAL, SM_FORMAT_COLUMNS},
      {SM_KIND_GENERAL, SM_FORMAT_ROWS},      {SM_KIND_SYMMETRIC, SM_FORMAT_SPARSE},
      {SM_KIND_SYMMETRIC, SM_FORMAT_COLUMNS}, {SM_KIND_SYMMETRIC, SM_FORMAT_ROWS},
      {SM_KIND_DIAGONAL, SM_FORMAT_COLUMNS},  {SM_KIND_DIAGONAL, SM_FORMAT_ROWS}};
  for (int round = 0; round < 5; ++round) {
    for (const auto& [kind, format] : shapes) {
      SmMatrix* matrix = typed(kind, format);
      if (round > 0) {
        ASSERT_EQ(fn().qxsmresize(matrix, 4, 4), SM_OK);
      }
      if (round > 1) {
        ASSERT_EQ(fn().qxsmassign(matrix, 1, 1, 0, 2.0), SM_OK);
      }
      if (round > 2) {
        ASSERT_EQ(fn().qxsmclose(matrix, 0.0), SM_OK);
      }
      if (round > 3) {
        ASSERT_EQ(fn().qxsmdelete(matrix), SM_OK);
      }
    }
  }
  EXPECT_EQ(instance_->matrix_capacity, 40);
  SmInstance* going = instance_;
  instance_ = nullptr;
  EXPECT_EQ(going->functions->qxsmDestroyInstance(&going), SM_OK);
  EXPECT_EQ(going, nullptr);
  EXPECT_EQ(record().live_pools(), 1) << "the extension's";
  EXPECT_EQ(record().live_trees(), 0);
}

TEST_P(Instance, one_instance_goes_without_touching_another) {
  SmInstance* other = CreateInstance(extension_);
  ASSERT_NE(other, nullptr);
  SmMatrix* theirs = nullptr;
  ASSERT_EQ(fn().qxsmnewss(other, &theirs, 3), SM_OK);
  SmMatrix* ours = nullptr;
  ASSERT_EQ(fn().qxsmnewss(instance_, &ours, 3), SM_OK);
  EXPECT_EQ(ours->registry_index, 1);
  EXPECT_EQ(theirs->registry_index, 1);
  EXPECT_EQ(qxsmDestroyInstance(&other), SM_OK);
  EXPECT_EQ(fn().qxsmassign(ours, 0, 2, 1, 1.5), SM_OK);
  EXPECT_EQ(fn().qxsmclose(ours, 0.0), SM_OK);
  double value = 0.0;
  EXPECT_EQ(fn().qxsmget(ours, 0, 2, &value), SM_OK);
  EXPECT_EQ(value, 1.5);
}

INSTANTIATE_BOTH_HOSTS(Instance);

}  // namespace
}  // namespace sm::test
