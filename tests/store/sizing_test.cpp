// Sizing dense and diagonal matrices, and the refusals that all shapes share.
#include <gtest/gtest.h>

#include <cmath>

#include "store/store_test.hpp"

namespace sm::test {
namespace {

class Sizing : public StoreTest {
 protected:
  void fill(SmMatrix* m) {
    for (std::int64_t k = 0; k < m->nnz; ++k) m->values[k] = 1.5;
  }
  static bool is_zero(const SmMatrix* m) {
    for (std::int64_t k = 0; k < m->nnz; ++k) {
      if (bits(m->values[k]) != 0) return false;
    }
    return true;
  }
  // What a dense or diagonal matrix is after its array could not be had.
  void expect_without_values(SmMatrix* m, std::int64_t rows, std::int64_t cols) {
    EXPECT_EQ(m->values, nullptr);
    EXPECT_EQ(m->nnz, 0);
    EXPECT_EQ(m->value_count, 0.0);
    EXPECT_EQ(m->rows, rows);
    EXPECT_EQ(m->cols, cols);
    EXPECT_EQ(set(m, 0, 0, 1.0), SM_BAD_ARGUMENT);
    EXPECT_EQ(add(m, 1, 1, 1.0), SM_BAD_ARGUMENT);
    double value = 1.0;
    EXPECT_EQ(fn().qxsmget(m, 0, 0, &value), SM_NO_ELEMENT);
    EXPECT_EQ(value, 0.0);
    EXPECT_EQ(fn().qxsmsetee(m, 1.0), SM_OK);
    EXPECT_EQ(fn().qxsmclose(m, 1.0), SM_OK);
  }
};

TEST_P(Sizing, a_record_without_a_kind_answers_1_before_anything_else) {
  SmMatrix* m = reset_record();
  EXPECT_EQ(fn().qxsmresize(m, 3, 3), SM_UNTYPED);
  EXPECT_EQ(fn().qxsmresize(m, -1, 3), SM_UNTYPED);
  EXPECT_EQ(fn().qxsmresize(m, 0, 3), SM_UNTYPED);
  EXPECT_EQ(m->rank, -1);
  EXPECT_EQ(m->rows, 0);
}

TEST_P(Sizing, bad_sizes_are_refused_before_shapes_and_change_nothing) {
  for (const Shape shape : kShapes) {
    SCOPED_TRACE(name_of(shape));
    SmMatrix* m = square(shape, 3);
    ASSERT_EQ(fn().qxsmclose(m, kNan), SM_OK);
    m->rank = 2;
    m->log_det = 0.5;
    m->definite = 1;
    const SmMatrix before = *m;
    for (const auto& [rows, cols] : {std::pair<std::int64_t, std::int64_t>{-1, 3},
                                     {3, -1},
                                     {-2, -2},
                                     {0, 5},
                                     {5, 0},
                                     {-kHuge - 1, kHuge},
                                     {0, kHuge}}) {
      EXPECT_EQ(fn().qxsmresize(m, rows, cols), SM_BAD_SIZE) << rows << ' ' << cols;
    }
    EXPECT_EQ(m->rank, 2);
    EXPECT_EQ(m->log_det, 0.5);
    EXPECT_EQ(m->definite, 1);
    EXPECT_EQ(m->rows, before.rows);
    EXPECT_EQ(m->nnz, before.nnz);
    EXPECT_EQ(m->values, before.values);
    EXPECT_EQ(m->state, before.state);
  }
}

TEST_P(Sizing, shapes_that_are_square_answer_111_before_they_count_values) {
  for (const Shape shape : {kSymmetricSparse, kSymmetricColumns, kSymmetricRows, kDiagonalColumns, kDiagonalRows}) {
    SCOPED_TRACE(name_of(shape));
    SmMatrix* m = square(shape, 3);
    m->rank = 3;
    m->definite = 1;
    m->log_det = 0.5;
    m->state = is_sparse(shape) ? SM_STATE_OPEN : SM_STATE_FACTORED;
    EXPECT_EQ(fn().qxsmresize(m, 3, 4), SM_NOT_SQUARE);
    EXPECT_EQ(fn().qxsmresize(m, kHuge, 1), SM_NOT_SQUARE);
    EXPECT_EQ(m->state, SM_STATE_CLOSED);
    EXPECT_EQ(m->definite, -1);
    expect_voided(m);
    EXPECT_EQ(m->rows, 3);
    EXPECT_EQ(m->cols, 3);
  }
}

TEST_P(Sizing, nothing_by_nothing_is_a_size_for_every_shape) {
  for (const Shape shape : kShapes) {
    SCOPED_TRACE(name_of(shape));
    SmMatrix* m = typed(shape);
    const std::int64_t blocks = host().live_blocks();
    for (int round = 0; round < 2; ++round) {
      EXPECT_EQ(fn().qxsmresize(m, 0, 0), SM_OK);
      EXPECT_EQ(fn().qxsmresize(m, 0, 0), SM_OK);
      EXPECT_EQ(m->rows, 0);
      EXPECT_EQ(m->cols, 0);
      EXPECT_EQ(m->nnz, 0);
      EXPECT_EQ(m->value_count, 0.0);
      EXPECT_EQ(m->values, nullptr);
      EXPECT_EQ(host().live_blocks(), blocks);
      EXPECT_EQ(set(m, 0, 0, 1.0), SM_OK) << "ignored";
      EXPECT_EQ(set(m, -1, 0, 1.0), SM_OK) << "ignored before the index is looked at";
      EXPECT_EQ(m->nnz, 0);
      EXPECT_EQ(fn().qxsmresize(m, 4, 4), SM_OK);
    }
  }
}

TEST_P(Sizing, dense_and_diagonal_matrices_begin_with_zeros_and_closed) {
  for (const Shape shape : kDense) {
    for (const std::int64_t n : {1, 2, 7}) {
      SCOPED_TRACE(name_of(shape) + " of order " + std::to_string(n));
      const std::int64_t cols = shape.kind == SM_KIND_GENERAL ? n + 3 : n;
      SmMatrix* m = make(shape, n, cols);
      EXPECT_EQ(m->state, SM_STATE_CLOSED);
      EXPECT_EQ(m->rows, n);
      EXPECT_EQ(m->cols, cols);
      EXPECT_EQ(m->nnz, slots(shape, n, cols));
      EXPECT_EQ(m->value_count, static_cast<double>(slots(shape, n, cols)));
      EXPECT_EQ(m->owns_values, 1);
      EXPECT_EQ(m->dense_factor, nullptr);
      ASSERT_NE(m->values, nullptr);
      EXPECT_TRUE(is_zero(m));
      EXPECT_EQ(m->rank, 0);
      EXPECT_EQ(m->definite, -1);
      EXPECT_TRUE(is_missing(m->log_det));
    }
  }
}

TEST_P(Sizing, the_same_size_again_clears_the_array_where_it_is) {
  for (const Shape shape : kDense) {
    SCOPED_TRACE(name_of(shape));
    SmMatrix* m = square(shape, 4);
    fill(m);
    m->rank = 4;
    m->log_det = 1.0;
    m->definite = 1;
    m->state = SM_STATE_INVERTED;
    double* values = m->values;
    const std::int64_t blocks = host().live_blocks();
    host().fail_request(0, true);  // nothing may be asked for
    EXPECT_EQ(fn().qxsmresize(m, 4, 4), SM_OK);
    EXPECT_EQ(host().stop_failing(), 0);
    EXPECT_EQ(m->values, values);
    EXPECT_TRUE(is_zero(m));
    EXPECT_EQ(m->nnz, slots(shape, 4, 4));
    EXPECT_EQ(m->state, SM_STATE_CLOSED);
    EXPECT_EQ(m->definite, -1);
    expect_voided(m);
    EXPECT_EQ(host().live_blocks(), blocks);
  }
}

TEST_P(Sizing, another_size_gives_the_array_back_and_takes_a_new_one) {
  for (const Shape shape : kDense) {
    SCOPED_TRACE(name_of(shape));
    SmMatrix* m = square(shape, 4);
    const std::int64_t blocks = host().live_blocks();
    for (const std::int64_t n : {9, 1, 5}) {
      fill(m);
      EXPECT_EQ(fn().qxsmresize(m, n, n), SM_OK);
      EXPECT_EQ(m->nnz, slots(shape, n, n));
      EXPECT_TRUE(is_zero(m));
      EXPECT_EQ(m->owns_values, 1);
      EXPECT_EQ(host().live_blocks(), blocks);
    }
    EXPECT_EQ(fn().qxsmresize(m, 0, 0), SM_OK);
    EXPECT_EQ(m->values, nullptr);
    EXPECT_EQ(host().live_blocks(), blocks - 1);
  }
}

TEST_P(Sizing, swapped_dimensions_are_another_size) {
  for (const Shape shape : {kGeneralColumns, kGeneralRows}) {
    SmMatrix* m = make(shape, 2, 3);
    fill(m);
    EXPECT_EQ(fn().qxsmresize(m, 3, 2), SM_OK);
    EXPECT_EQ(m->rows, 3);
    EXPECT_EQ(m->cols, 2);
    EXPECT_TRUE(is_zero(m));
    EXPECT_EQ(set(m, 2, 1, 1.0), SM_OK);
    EXPECT_EQ(at(m, 2, 1), 1.0);
  }
}

TEST_P(Sizing, a_separate_factor_goes_back_with_either_size) {
  for (const Shape shape : kSquareFactored) {
    for (const std::int64_t n : {3, 5}) {
      SCOPED_TRACE(name_of(shape) + " to order " + std::to_string(n));
      SmMatrix* m = definite(shape);
      const std::int64_t blocks = host().live_blocks();
      ASSERT_EQ(fn().qxsmfact(m, 0), SM_OK);
      ASSERT_NE(m->dense_factor, nullptr);
      EXPECT_EQ(fn().qxsmresize(m, n, n), SM_OK);
      EXPECT_EQ(m->dense_factor, nullptr);
      EXPECT_EQ(m->state, SM_STATE_CLOSED);
      EXPECT_EQ(m->definite, -1);
      expect_voided(m);
      EXPECT_EQ(host().live_blocks(), blocks);
    }
  }
}

TEST_P(Sizing, more_values_than_can_be_counted_answer_105_and_leave_none) {
  struct Case {
    Shape shape;
    std::int64_t rows, cols;
  };
  // 2^32 x 2^32 and orders near 2^32.5 wrap 64-bit products round to something small.
  const std::int64_t wrap = std::int64_t{1} << 32;
  const Case cases[] = {{kGeneralColumns, wrap, wrap},
                        {kGeneralRows, wrap, wrap},
                        {kGeneralRows, SM_MAX_ELEMENTS + 2, 1},
                        {kGeneralColumns, 1, kHuge},
                        {kGeneralRows, kHuge, kHuge},
                        {kGeneralRows, 3, 6148914691236517206},  // 3 * this is 2 modulo 2^64
                        {kSymmetricColumns, std::int64_t{1} << 28, std::int64_t{1} << 28},
                        {kSymmetricRows, wrap, wrap},
                        {kSymmetricRows, 2 * wrap - 1, 2 * wrap - 1},
                        {kSymmetricColumns, kHuge, kHuge}};
  for (const Case& c : cases) {
    SCOPED_TRACE(name_of(c.shape) + " " + std::to_string(c.rows) + " x " + std::to_string(c.cols));
    SmMatrix* m = square(c.shape, 3);
    const std::int64_t blocks = host().live_blocks();
    EXPECT_EQ(fn().qxsmresize(m, c.rows, c.cols), SM_TOO_LARGE);
    expect_without_values(m, c.rows, c.cols);
    EXPECT_EQ(host().live_blocks(), blocks - 1) << "the old array goes back";
    EXPECT_EQ(fn().qxsmresize(m, c.rows, c.cols), SM_TOO_LARGE) << "asked again, there is still nothing to clear";
    EXPECT_EQ(fn().qxsmresize(m, 3, 3), SM_OK);
    EXPECT_EQ(set(m, 1, 1, 2.0), SM_OK);
  }
}

// A diagonal's values are not counted against a limit of their own: memory ends first.
TEST_P(Sizing, a_diagonal_beyond_any_memory_answers_101_and_leaves_no_values) {
  for (const Shape shape : {kDiagonalColumns, kDiagonalRows}) {
    for (const std::int64_t n : {SM_MAX_ELEMENTS, std::int64_t{1} << 61, kHuge}) {  // 2^61 * 8 wraps to 0
      SmMatrix* m = square(shape, 3);
      EXPECT_EQ(fn().qxsmresize(m, n, n), SM_NO_MEMORY) << n;
      expect_without_values(m, n, n);
      EXPECT_EQ(fn().qxsmresize(m, 3, 3), SM_OK);
      EXPECT_EQ(set(m, 2, 2, 2.0), SM_OK);
    }
  }
}

TEST_P(Sizing, an_array_that_cannot_be_had_answers_101_and_the_next_try_gets_one) {
  for (const Shape shape : kDense) {
    SCOPED_TRACE(name_of(shape));
    SmMatrix* m = square(shape, 3);
    const std::int64_t blocks = host().live_blocks();
    host().fail_request(0, false);
    EXPECT_EQ(fn().qxsmresize(m, 5, 5), SM_NO_MEMORY);
    EXPECT_EQ(host().stop_failing(), 1);
    expect_without_values(m, 5, 5);
    EXPECT_EQ(host().live_blocks(), blocks - 1);
    EXPECT_EQ(fn().qxsmresize(m, 5, 5), SM_OK) << "the size is the same, the array is not there";
    ASSERT_NE(m->values, nullptr);
    EXPECT_EQ(m->nnz, slots(shape, 5, 5));
    EXPECT_EQ(m->value_count, static_cast<double>(slots(shape, 5, 5)));
    EXPECT_EQ(m->owns_values, 1);
    EXPECT_TRUE(is_zero(m));
  }
}

TEST_P(Sizing, a_size_beyond_any_memory_answers_101) {
  SmMatrix* m = typed(kGeneralRows);
  EXPECT_EQ(fn().qxsmresize(m, SM_MAX_ELEMENTS, 1), SM_NO_MEMORY);
  expect_without_values(m, SM_MAX_ELEMENTS, 1);
}

TEST_P(Sizing, a_kind_that_does_not_exist_answers_124_and_state_1) {
  SmMatrix* m = typed(kGeneralRows);
  m->kind = 5;
  EXPECT_EQ(fn().qxsmresize(m, 2, 3), SM_UNAVAILABLE);
  EXPECT_EQ(m->state, SM_STATE_CLOSED);
  m->kind = SM_KIND_GENERAL;
}

TEST_P(Sizing, a_packed_size_that_was_refused_has_no_room_at_any_index) {
  // Orders and columns for which the packed position itself cannot be counted.
  for (const Shape shape : kPacked) {
    SmMatrix* m = typed(shape);
    ASSERT_EQ(fn().qxsmresize(m, std::int64_t{1} << 62, std::int64_t{1} << 62), SM_TOO_LARGE);
    for (const std::int64_t col : {std::int64_t{0}, std::int64_t{3037000500}, std::int64_t{1} << 61}) {
      EXPECT_EQ(fn().qxsmassign(m, 0, col, 0, 1.0), SM_BAD_ARGUMENT);
      EXPECT_EQ(fn().qxsmassign(m, col, col, 1, 1.0), SM_BAD_ARGUMENT);
    }
  }
}

INSTANTIATE_BOTH_HOSTS(Sizing);

}  // namespace
}  // namespace sm::test
