// Sparse matrices that grow under qxsmassign.
#include <gtest/gtest.h>

#include "store/store_test.hpp"
#include "support/random_matrices.hpp"

namespace sm::test {
namespace {

class Growth : public StoreTest {};

TEST_P(Growth, row_30_of_a_general_matrix_of_5_rows_makes_it_31_rows_on_51_roots) {
  SmMatrix* m = make(kGeneralSparse, 5, 4);
  for (std::int64_t r = 0; r < 5; ++r) ASSERT_EQ(set(m, r, 3 - r % 4, 1.0 + static_cast<double>(r)), SM_OK);
  const Nonzeros before = walk(m, m->row_roots);
  const std::int64_t blocks = host().live_blocks();
  const std::int64_t nodes = m->slab_nodes;
  ASSERT_EQ(set(m, 30, 2, 9.0), SM_OK);
  EXPECT_EQ(m->rows, 31);
  EXPECT_EQ(m->cols, 4);
  EXPECT_EQ(m->row_capacity, 51);
  EXPECT_EQ(m->value_count, 31.0 * 4.0);
  EXPECT_EQ(m->slab_nodes, nodes);
  EXPECT_EQ(host().live_blocks(), blocks) << "the old root array goes back";
  Nonzeros after = before;
  after[{30, 2}] = 9.0;
  EXPECT_EQ(walk(m, m->row_roots), after);
  for (std::int64_t k = 31; k < 51; ++k) EXPECT_EQ(m->row_roots[k], 0U);
}

TEST_P(Growth, rows_inside_the_root_array_need_no_new_one) {
  SmMatrix* m = make(kGeneralSparse, 5, 4);
  const std::uint64_t* roots = m->row_roots;
  host().fail_request(0, true);
  ASSERT_EQ(set(m, 19, 0, 1.0), SM_OK);
  EXPECT_EQ(host().stop_failing(), 0);
  EXPECT_EQ(m->rows, 20);
  EXPECT_EQ(m->row_capacity, 20);
  EXPECT_EQ(m->row_roots, roots);
  ASSERT_EQ(set(m, 20, 0, 1.0), SM_OK);
  EXPECT_EQ(m->rows, 21);
  EXPECT_EQ(m->row_capacity, 41);
}

TEST_P(Growth, columns_of_a_general_matrix_grow_alone) {
  SmMatrix* m = make(kGeneralSparse, 5, 4);
  ASSERT_EQ(add(m, 1, 100, 1.0), SM_OK);
  EXPECT_EQ(m->rows, 5);
  EXPECT_EQ(m->cols, 101);
  EXPECT_EQ(m->value_count, 505.0);
  EXPECT_EQ(m->row_capacity, 20);
  EXPECT_EQ(at(m, 1, 100), 1.0);
  ASSERT_EQ(add(m, 6, 200, 1.0), SM_OK);
  EXPECT_EQ(m->rows, 7);
  EXPECT_EQ(m->cols, 201);
  EXPECT_EQ(m->value_count, 7.0 * 201.0);
}

TEST_P(Growth, a_symmetric_matrix_covers_the_larger_of_row_and_column) {
  SmMatrix* m = square(kSymmetricSparse, 5);
  const std::int64_t blocks = host().live_blocks();
  ASSERT_EQ(set(m, 2, 30, 7.0), SM_OK);
  EXPECT_EQ(m->rows, 31);
  EXPECT_EQ(m->cols, 31);
  EXPECT_EQ(m->row_capacity, 51);
  EXPECT_EQ(m->value_count, 31.0 * 32.0 / 2.0);
  EXPECT_EQ(m->nnz, 6) << "the new rows have no diagonal yet";
  EXPECT_EQ(host().live_blocks(), blocks);
  EXPECT_EQ(m->state, SM_STATE_OPEN);
  Nonzeros expected{{{2, 30}, 7.0}};
  for (std::int64_t i = 0; i < 5; ++i) expected[{i, i}] = 0.0;
  EXPECT_EQ(walk(m, m->sym_roots), expected);
}

TEST_P(Growth, a_symmetric_matrix_grows_inside_its_root_array_too) {
  SmMatrix* m = square(kSymmetricSparse, 5);
  ASSERT_EQ(set(m, 0, 19, 7.0), SM_OK);
  EXPECT_EQ(m->rows, 20);
  EXPECT_EQ(m->cols, 20);
  EXPECT_EQ(m->row_capacity, 20);
  EXPECT_EQ(m->value_count, 210.0);
  ASSERT_EQ(set(m, 20, 20, 7.0), SM_OK);
  EXPECT_EQ(m->rows, 21);
  EXPECT_EQ(m->row_capacity, 41);
  EXPECT_EQ(m->nnz, 7);
}

TEST_P(Growth, closing_supplies_the_diagonals_that_growth_left_out) {
  for (const double tolerance : {0.0, 0.5, kNan}) {
    SmMatrix* m = square(kSymmetricSparse, 5);
    ASSERT_EQ(set(m, 2, 30, 7.0), SM_OK);
    ASSERT_EQ(set(m, 10, 10, 3.0), SM_OK);
    ASSERT_EQ(set(m, 11, 12, 2.0), SM_OK);
    ASSERT_EQ(fn().qxsmclose(m, tolerance), SM_OK);
    EXPECT_EQ(m->nnz, 31 + 2);
    Nonzeros expected{{{2, 30}, 7.0}, {{11, 12}, 2.0}};
    for (std::int64_t i = 0; i < 31; ++i) expected[{i, i}] = i == 10 ? 3.0 : 0.0;
    EXPECT_EQ(compressed(m), expected);
    EXPECT_EQ(at(m, 30, 30), 0.0);
    EXPECT_EQ(at(m, 2, 30), 7.0);
  }
}

TEST_P(Growth, a_grown_matrix_is_factored_like_any_other) {
  SmMatrix* m = square(kSymmetricSparse, 1);
  for (std::int64_t i = 0; i < 40; ++i) ASSERT_EQ(add(m, i, i, 2.0), SM_OK);
  ASSERT_EQ(add(m, 3, 45, 1.0), SM_OK);
  ASSERT_EQ(add(m, 45, 45, 1.0), SM_OK);
  ASSERT_EQ(fn().qxsmclose(m, 0.0), SM_OK);
  std::int64_t rank = 0;
  EXPECT_EQ(fn().qxsmrank(m, &rank), SM_OK);
  EXPECT_EQ(rank, 41) << "rows 40 to 44 are zero";
}

TEST_P(Growth, an_index_that_no_array_can_reach_answers_105) {
  SmMatrix* g = make(kGeneralSparse, 5, 5);
  SmMatrix* s = square(kSymmetricSparse, 5);
  for (const std::int64_t far : {SM_MAX_ELEMENTS, std::int64_t{1} << 61, kHuge - 1, kHuge}) {
    EXPECT_EQ(set(g, far, 0, 1.0), SM_TOO_LARGE) << far;
    EXPECT_EQ(add(g, far, far, 1.0), SM_TOO_LARGE) << far;
    EXPECT_EQ(set(s, 0, far, 1.0), SM_TOO_LARGE) << far;
    EXPECT_EQ(add(s, far, far, 1.0), SM_TOO_LARGE) << far;
  }
  EXPECT_EQ(set(g, 0, kHuge, 1.0), SM_TOO_LARGE) << "no count of columns is that large";
  for (const SmMatrix* m : {g, s}) {
    EXPECT_EQ(m->rows, 5);
    EXPECT_EQ(m->cols, 5);
    EXPECT_EQ(m->row_capacity, 20);
    EXPECT_EQ(m->nnz, m == g ? 0 : 5);
  }
  EXPECT_EQ(set(g, 4, 4, 1.0), SM_OK);
  EXPECT_EQ(set(s, 4, 4, 1.0), SM_OK);
}

TEST_P(Growth, an_index_beyond_any_memory_answers_101_and_changes_nothing) {
  const std::int64_t far = std::int64_t{1} << 50;
  SmMatrix* g = make(kGeneralSparse, 5, 5);
  SmMatrix* s = square(kSymmetricSparse, 5);
  EXPECT_EQ(set(g, far, 0, 1.0), SM_NO_MEMORY);
  EXPECT_EQ(set(s, 0, far, 1.0), SM_NO_MEMORY);
  for (const SmMatrix* m : {g, s}) {
    EXPECT_EQ(m->rows, 5);
    EXPECT_EQ(m->cols, 5);
    EXPECT_EQ(m->row_capacity, 20);
  }
  EXPECT_EQ(set(g, 4, 4, 1.0), SM_OK);
  EXPECT_EQ(set(s, 0, 4, 1.0), SM_OK);
}

TEST_P(Growth, a_symmetric_model_grown_at_random_closes_to_its_map) {
  for (std::uint64_t seed = 100; seed < 112; ++seed) {
    SCOPED_TRACE(seed);
    Random random(seed);
    std::int64_t n = 1 + random.below(10);
    SmMatrix* m = square(kSymmetricSparse, n);
    Nonzeros model;
    const std::int64_t width = 5 + random.below(80);
    for (int step = 0; step < 800; ++step) {
      std::int64_t r = random.below(width);
      std::int64_t c = random.below(width);
      if (r > c) std::swap(r, c);
      const double value = random.dyadic();
      const bool adds = random.chance(50);
      ASSERT_EQ(fn().qxsmassign(m, r, c, adds ? 1 : 0, value), SM_OK);
      double& stored = model[{r, c}];
      stored = adds ? stored + value : value;
      n = std::max(n, c + 1);
    }
    ASSERT_EQ(m->rows, n);
    ASSERT_EQ(fn().qxsmclose(m, kNan), SM_OK);
    for (std::int64_t i = 0; i < n; ++i) model.try_emplace({i, i}, 0.0);
    EXPECT_EQ(compressed(m), model);
  }
}

INSTANTIATE_BOTH_HOSTS(Growth);

}  // namespace
}  // namespace sm::test
