// Resetting and destroying: qxsmdelete, qxsmDestroyMatrix and what they hand back to the host.
#include <gtest/gtest.h>

#include <array>

#include "frame/recorded_test.hpp"
#include "store/store_test.hpp"

namespace sm::test {
namespace {

class Reset : public StoreTest {};

void expect_reset(const SmMatrix* m) {
  EXPECT_EQ(m->kind, SM_KIND_NONE);
  EXPECT_EQ(m->format, SM_FORMAT_NONE);
  EXPECT_EQ(m->state, SM_STATE_OPEN);
  EXPECT_EQ(m->rows, 0);
  EXPECT_EQ(m->cols, 0);
  EXPECT_EQ(m->nnz, 0);
  EXPECT_EQ(m->value_count, 0.0);
  EXPECT_EQ(m->solver_word, 0);
  EXPECT_EQ(m->slab_nodes, 0);
  EXPECT_EQ(m->slab_bytes, 0);
  EXPECT_EQ(m->slab_used, 0);
  EXPECT_EQ(m->rank, -1);
  EXPECT_TRUE(is_missing(m->log_det));
  EXPECT_EQ(m->pool, nullptr);
  EXPECT_EQ(m->assembly_pool, nullptr);
  EXPECT_EQ(m->tree, nullptr);
  EXPECT_EQ(m->spare_node, nullptr);
  EXPECT_EQ(m->next_node, nullptr);
  EXPECT_EQ(m->values, nullptr);
  EXPECT_EQ(m->row_start, nullptr);
  EXPECT_EQ(m->owns_values, 0);
  expect_no_factor(m);
  EXPECT_EQ(m->sym_roots, nullptr);
}

TEST_P(Reset, takes_every_shape_back_to_no_kind_at_every_state) {
  for (const Shape shape : kShapes) {
    for (int steps = 0; steps < 4; ++steps) {
      SCOPED_TRACE(name_of(shape) + " after " + std::to_string(steps) + " steps");
      const std::int64_t pools = host().live_pools();
      SmMatrix* m = typed(shape);
      const std::int64_t index = m->registry_index;
      if (steps > 0) {
        ASSERT_EQ(fn().qxsmresize(m, 3, 3), SM_OK);
      }
      for (std::int64_t i = 0; steps > 1 && i < 3; ++i) ASSERT_EQ(set(m, i, i, 4.0), SM_OK);
      if (steps > 2) {
        ASSERT_EQ(fn().qxsmclose(m, 0.0), SM_OK);
        ASSERT_EQ(fn().qxsmfact(m, 0), shape.kind == SM_KIND_GENERAL ? SM_UNAVAILABLE : SM_OK);
      }
      m->solver_word = 5;
      EXPECT_EQ(fn().qxsmdelete(m), SM_OK);
      expect_reset(m);
      EXPECT_EQ(m->registry_index, index);
      EXPECT_EQ(m->instance, instance());
      EXPECT_EQ(instance()->registry[index - 1], nullptr);
      EXPECT_EQ(host().live_pools(), pools);
    }
  }
}

TEST_P(Reset, twice_or_of_nothing_is_harmless) {
  EXPECT_EQ(fn().qxsmdelete(nullptr), SM_OK);
  SmMatrix* m = square(kSymmetricSparse, 3);
  EXPECT_EQ(fn().qxsmdelete(m), SM_OK);
  EXPECT_EQ(fn().qxsmdelete(m), SM_OK);
  expect_reset(m);
}

TEST_P(Reset, leaves_a_callers_array_alone) {
  std::array<double, 9> mine{};
  mine.fill(2.5);
  SmMatrix* m = square(kGeneralRows, 2);
  ASSERT_EQ(qxsmtie(m, mine.data(), 3, 3, SM_KIND_GENERAL, SM_FORMAT_ROWS), SM_OK);
  EXPECT_EQ(fn().qxsmdelete(m), SM_OK);
  expect_reset(m);
  for (const double value : mine) EXPECT_EQ(value, 2.5);
  EXPECT_EQ(host().violations(), 0);
}

TEST_P(Reset, a_record_without_a_kind_answers_1_or_0_and_changes_nothing) {
  SmMatrix* m = reset_record();
  double value = 0.0;
  EXPECT_EQ(fn().qxsmresize(m, 2, 2), SM_UNTYPED);
  EXPECT_EQ(set(m, 0, 0, 1.0), SM_OK);
  EXPECT_EQ(fn().qxsmget(m, 0, 0, &value), SM_NO_ELEMENT);
  EXPECT_EQ(fn().qxsmsetee(m, 1.0), SM_OK);
  EXPECT_EQ(qxsmremove(m, 0, 0), SM_OK);
  EXPECT_EQ(fn().qxsmzscp(m, &value, nullptr, 1, 1.0), SM_OK);
  EXPECT_EQ(fn().qxsmfact(m, 0), SM_OK);
  expect_reset(m);
}

TEST_P(Reset, destroying_frees_the_record_and_nulls_the_handle) {
  const std::int64_t registry = square(kGeneralRows, 2) ? host().live_blocks() : 0;
  const std::int64_t pools = host().live_pools();
  for (const Shape shape : kShapes) {
    SCOPED_TRACE(name_of(shape));
    SmMatrix* m = square(shape, 3);
    const std::int64_t index = m->registry_index;
    EXPECT_EQ(fn().qxsmDestroyMatrix(instance(), &m), SM_OK);
    EXPECT_EQ(m, nullptr);
    EXPECT_EQ(instance()->registry[index - 1], nullptr);
    EXPECT_EQ(host().live_blocks(), registry);
    EXPECT_EQ(host().live_pools(), pools);
  }
}

TEST_P(Reset, destroying_nothing_is_harmless) {
  EXPECT_EQ(fn().qxsmDestroyMatrix(instance(), nullptr), SM_OK);
  SmMatrix* none = nullptr;
  EXPECT_EQ(fn().qxsmDestroyMatrix(instance(), &none), SM_OK);
  EXPECT_EQ(none, nullptr);
}

TEST_P(Reset, a_reset_record_can_be_destroyed) {
  SmMatrix* m = reset_record();
  const std::int64_t blocks = host().live_blocks();
  EXPECT_EQ(fn().qxsmDestroyMatrix(instance(), &m), SM_OK);
  EXPECT_EQ(host().live_blocks(), blocks - 1);
}

int resets_seen = 0;

TEST_P(Reset, destroying_goes_through_the_tables_own_reset) {
  SmMatrix* m = square(kSymmetricSparse, 3);
  resets_seen = 0;
  instance()->functions->qxsmdelete = [](SmMatrix* matrix) {
    ++resets_seen;
    return qxsmdelete(matrix);
  };
  EXPECT_EQ(fn().qxsmDestroyMatrix(instance(), &m), SM_OK);
  EXPECT_EQ(resets_seen, 1);
  instance()->functions->qxsmdelete = nullptr;
  SmMatrix* empty = nullptr;
  ASSERT_EQ(fn().qxsmnew(instance(), &empty, SM_KIND_GENERAL, SM_FORMAT_ROWS), SM_OK);
  ASSERT_EQ(qxsmdelete(empty), SM_OK);
  EXPECT_EQ(fn().qxsmDestroyMatrix(instance(), &empty), SM_OK);
  EXPECT_EQ(empty, nullptr);
  instance()->functions->qxsmdelete = &qxsmdelete;
}

class ResetRecorded : public RecordedTest {};

TEST_P(ResetRecorded, an_inner_object_is_reset_and_released_before_its_tree_goes) {
  record().give_trees_an_inner_object(true);
  start();
  for (const bool general : {true, false}) {
    SmMatrix* m = nullptr;
    ASSERT_EQ(instance_->functions->qxsmnew(instance_, &m, general ? SM_KIND_GENERAL : SM_KIND_SYMMETRIC, 21), SM_OK);
    ASSERT_EQ(instance_->functions->qxsmresize(m, 3, 3), SM_OK);
    record().events.clear();
    EXPECT_EQ(instance_->functions->qxsmdelete(m), SM_OK);
    EXPECT_EQ(record().events, (std::vector<std::string>{"inner reset 1 1", "inner released, word cleared",
                                                         "tree destroyed, word cleared"}));
    EXPECT_EQ(instance_->functions->qxsmdelete(m), SM_OK);
    EXPECT_EQ(record().events.size(), 3U);
  }
}

TEST_P(ResetRecorded, a_tree_without_an_inner_object_is_just_destroyed) {
  start();
  SmMatrix* m = nullptr;
  ASSERT_EQ(instance_->functions->qxsmnewsg(instance_, &m, 3, 3), SM_OK);
  record().events.clear();
  EXPECT_EQ(instance_->functions->qxsmDestroyMatrix(instance_, &m), SM_OK);
  EXPECT_EQ(record().events, std::vector<std::string>{"tree destroyed"});
}

TEST_P(ResetRecorded, a_tree_lives_as_long_as_its_matrix_has_a_type) {
  start();
  SmMatrix* m = nullptr;
  const SmFunctionTable& fn = *instance_->functions;
  ASSERT_EQ(fn.qxsmnewss(instance_, &m, 3), SM_OK);
  EXPECT_EQ(record().live_trees(), 1);
  ASSERT_EQ(fn.qxsmclose(m, 0.0), SM_OK);
  ASSERT_EQ(fn.qxsmresize(m, 5, 5), SM_OK);
  EXPECT_EQ(record().trees.size(), 1U) << "sizing makes no second one";
  double mine[4] = {1.0, 2.0, 3.0, 4.0};
  ASSERT_EQ(qxsmtie(m, mine, 2, 2, SM_KIND_GENERAL, SM_FORMAT_ROWS), SM_OK);
  EXPECT_EQ(fn.qxsmdelete(m), SM_OK);
  EXPECT_EQ(record().live_trees(), 0);
}

TEST_P(ResetRecorded, destroying_the_instance_resets_through_the_same_road) {
  record().give_trees_an_inner_object(true);
  start();
  SmMatrix* m = nullptr;
  ASSERT_EQ(instance_->functions->qxsmnewss(instance_, &m, 3), SM_OK);
  record().events.clear();
  EXPECT_EQ(qxsmDestroyInstance(&instance_), SM_OK);
  EXPECT_EQ(record().events.size(), 3U);
  EXPECT_EQ(record().live_trees(), 0);
}

INSTANTIATE_BOTH_HOSTS(Reset);
INSTANTIATE_BOTH_HOSTS(ResetRecorded);

}  // namespace
}  // namespace sm::test
