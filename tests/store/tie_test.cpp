// Matrices on the caller's arrays: qxsmtie.
#include <gtest/gtest.h>

#include <cmath>
#include <vector>

#include "store/store_test.hpp"

namespace sm::test {
namespace {

class Tie : public StoreTest {
 protected:
  // Twelve doubles 1, 2, ..., and room on both sides that must stay as it is.
  Tie() : room_(32, -7.0) {
    for (int k = 0; k < 12; ++k) data()[k] = k + 1.0;
  }
  void TearDown() override {
    for (int k = 0; k < 32; ++k) {
      if (k < 8 || k >= 20) {
        EXPECT_EQ(room_[static_cast<std::size_t>(k)], -7.0) << k;
      }
    }
    StoreTest::TearDown();
  }
  double* data() { return room_.data() + 8; }
  SmStatus tie(SmMatrix* m, double* values, std::int64_t rows, std::int64_t cols, Shape shape) {
    return qxsmtie(m, values, rows, cols, shape.kind, shape.format);
  }
  void expect_tied(const SmMatrix* m, const double* values, std::int64_t rows, std::int64_t cols, Shape shape) {
    EXPECT_EQ(m->values, values);
    EXPECT_EQ(m->owns_values, 0);
    EXPECT_EQ(m->rows, rows);
    EXPECT_EQ(m->cols, cols);
    EXPECT_EQ(m->kind, shape.kind);
    EXPECT_EQ(m->format, shape.format);
    EXPECT_EQ(m->nnz, slots(shape, rows, cols));
    EXPECT_EQ(m->value_count, static_cast<double>(slots(shape, rows, cols)));
    EXPECT_EQ(m->dense_factor, nullptr);
    EXPECT_TRUE(is_missing(m->log_det));
  }

 private:
  std::vector<double> room_;
};

TEST_P(Tie, attaches_the_array_in_the_layout_of_the_format) {
  for (const Shape shape : kDense) {
    SCOPED_TRACE(name_of(shape));
    SmMatrix* m = typed(kGeneralRows);
    const std::int64_t cols = shape.kind == SM_KIND_GENERAL ? 4 : 3;
    ASSERT_EQ(tie(m, data(), 3, cols, shape), SM_OK);
    expect_tied(m, data(), 3, cols, shape);
    EXPECT_EQ(m->state, SM_STATE_CLOSED);
    for (std::int64_t r = 0; r < 3; ++r) {
      for (std::int64_t c = r; c < cols; ++c) {
        if (slot_of(shape, 3, cols, r, c) < 0) continue;
        EXPECT_EQ(at(m, r, c), data()[slot_of(shape, 3, cols, r, c)]) << r << ' ' << c;
      }
    }
    EXPECT_EQ(add(m, 1, 1, 0.5), SM_OK);
    EXPECT_EQ(data()[slot_of(shape, 3, cols, 1, 1)], static_cast<double>(slot_of(shape, 3, cols, 1, 1)) + 1.5);
    data()[slot_of(shape, 3, cols, 1, 1)] -= 0.5;
  }
}

TEST_P(Tie, refuses_missing_data_and_negative_sizes_and_changes_nothing) {
  SmMatrix* m = square(kGeneralRows, 3);
  ASSERT_EQ(set(m, 2, 2, 5.0), SM_OK);
  double* values = m->values;
  EXPECT_EQ(tie(m, nullptr, 3, 3, kGeneralRows), SM_BAD_ARGUMENT);
  EXPECT_EQ(tie(m, nullptr, 1, 0, kGeneralRows), SM_BAD_ARGUMENT);
  EXPECT_EQ(tie(m, nullptr, 0, 1, kGeneralRows), SM_BAD_ARGUMENT);
  for (const Shape shape : {kGeneralRows, kSymmetricColumns, kDiagonalRows, kGeneralSparse, Shape{5, 22}}) {
    EXPECT_EQ(tie(m, data(), -1, 3, shape), SM_BAD_ARGUMENT);
    EXPECT_EQ(tie(m, data(), 3, -1, shape), SM_BAD_ARGUMENT);
    EXPECT_EQ(tie(m, data(), -2, -2, shape), SM_BAD_ARGUMENT);
    EXPECT_EQ(tie(m, nullptr, -2, -2, shape), SM_BAD_ARGUMENT);
    EXPECT_EQ(tie(m, data(), -kHuge - 1, -kHuge - 1, shape), SM_BAD_ARGUMENT);
    EXPECT_EQ(tie(m, nullptr, 2, 3, shape), SM_BAD_ARGUMENT) << "before shape, format and kind";
  }
  EXPECT_EQ(m->values, values);
  EXPECT_EQ(at(m, 2, 2), 5.0);
  EXPECT_EQ(m->owns_values, 1);
}

TEST_P(Tie, other_refusals_come_in_order_and_leave_the_matrix_empty) {
  struct Case {
    Shape shape;
    std::int64_t rows, cols;
    SmStatus answer;
  };
  const std::int64_t wrap = std::int64_t{1} << 32;
  const Case cases[] = {{{SM_KIND_SYMMETRIC, 21}, 2, 3, SM_NOT_SQUARE},
                        {{SM_KIND_DIAGONAL, 24}, 3, 2, SM_NOT_SQUARE},
                        {kSymmetricRows, kHuge, 1, SM_NOT_SQUARE},
                        {{SM_KIND_SYMMETRIC, 21}, 2, 2, SM_UNAVAILABLE},
                        {{SM_KIND_DIAGONAL, 21}, 2, 2, SM_UNAVAILABLE},
                        {{SM_KIND_GENERAL, 21}, 2, 3, SM_UNAVAILABLE},
                        {{SM_KIND_GENERAL, 24}, wrap, wrap, SM_UNAVAILABLE},
                        {{SM_KIND_NONE, 22}, 2, 3, SM_UNAVAILABLE},
                        {{5, 22}, kHuge, 2, SM_UNAVAILABLE},
                        {kGeneralRows, wrap, wrap, SM_TOO_LARGE},
                        {kGeneralColumns, kHuge, kHuge, SM_TOO_LARGE},
                        {kSymmetricRows, wrap, wrap, SM_TOO_LARGE},
                        {kSymmetricColumns, kHuge, kHuge, SM_TOO_LARGE},
                        {kDiagonalRows, SM_MAX_ELEMENTS + 2, SM_MAX_ELEMENTS + 2, SM_TOO_LARGE}};
  for (const Case& c : cases) {
    SCOPED_TRACE(name_of(c.shape) + " " + std::to_string(c.rows) + " x " + std::to_string(c.cols));
    SmMatrix* m = square(kGeneralRows, 3);
    const std::int64_t blocks = host().live_blocks();
    EXPECT_EQ(tie(m, data(), c.rows, c.cols, c.shape), c.answer);
    EXPECT_EQ(m->nnz, 0);
    EXPECT_EQ(m->values, nullptr);
    EXPECT_EQ(m->rows, 0);
    EXPECT_EQ(m->cols, 0);
    EXPECT_EQ(host().live_blocks(), blocks - 1);
    EXPECT_EQ(tie(m, data(), 2, 2, kGeneralRows), SM_OK);
  }
}

TEST_P(Tie, nothing_can_be_tied_without_data) {
  for (const Shape shape : kDense) {
    SmMatrix* m = square(kSymmetricRows, 3);
    EXPECT_EQ(tie(m, nullptr, 0, 0, shape), SM_OK);
    EXPECT_EQ(m->kind, shape.kind);
    EXPECT_EQ(m->nnz, 0);
    EXPECT_EQ(m->values, nullptr);
    EXPECT_EQ(set(m, 0, 0, 1.0), SM_OK);
  }
  SmMatrix* m = typed(kGeneralRows);
  EXPECT_EQ(tie(m, data(), 0, 5, kGeneralRows), SM_OK) << "no size of an owned array, but five columns of nothing";
  EXPECT_EQ(m->nnz, 0);
}

TEST_P(Tie, counts_to_2_to_the_53) {
  SmMatrix* m = typed(kGeneralRows);
  EXPECT_EQ(tie(m, data(), SM_MAX_ELEMENTS, 1, kGeneralRows), SM_OK) << "nobody reads behind what is there";
  EXPECT_EQ(m->nnz, SM_MAX_ELEMENTS);
  EXPECT_EQ(at(m, 11, 0), 12.0);
  EXPECT_EQ(refused_at(m, SM_MAX_ELEMENTS, 0), SM_OUTSIDE);
  EXPECT_EQ(set(m, SM_MAX_ELEMENTS, 0, 1.0), SM_BAD_ARGUMENT);
}

TEST_P(Tie, gives_an_owned_array_and_its_factor_back) {
  for (const Shape shape : kSquareFactored) {
    SCOPED_TRACE(name_of(shape));
    SmMatrix* m = definite(shape);
    ASSERT_EQ(fn().qxsmfact(m, 0), SM_OK);
    const std::int64_t blocks = host().live_blocks();
    ASSERT_EQ(tie(m, data(), 3, 3, shape), SM_OK);
    expect_tied(m, data(), 3, 3, shape);
    EXPECT_EQ(m->state, SM_STATE_CLOSED);
    EXPECT_EQ(host().live_blocks(), blocks - 2);
  }
}

TEST_P(Tie, tying_again_lets_the_first_array_go_as_it_is) {
  std::vector<double> other(9, 3.5);
  SmMatrix* m = typed(kGeneralRows);
  ASSERT_EQ(tie(m, data(), 3, 3, kGeneralRows), SM_OK);
  ASSERT_EQ(tie(m, other.data(), 3, 3, kGeneralRows), SM_OK);
  expect_tied(m, other.data(), 3, 3, kGeneralRows);
  for (int k = 0; k < 9; ++k) EXPECT_EQ(data()[k], k + 1.0);
  ASSERT_EQ(tie(m, other.data(), 3, 3, kGeneralColumns), SM_OK) << "the same array again";
  for (const double value : other) EXPECT_EQ(value, 3.5);
  EXPECT_EQ(host().violations(), 0);
}

TEST_P(Tie, the_same_size_again_clears_the_callers_array) {
  for (const Shape shape : kDense) {
    SCOPED_TRACE(name_of(shape));
    std::vector<double> mine(9, 3.5);
    SmMatrix* m = typed(shape);
    ASSERT_EQ(tie(m, mine.data(), 3, 3, shape), SM_OK);
    EXPECT_EQ(fn().qxsmresize(m, 3, 3), SM_OK);
    expect_tied(m, mine.data(), 3, 3, shape);
    for (std::int64_t k = 0; k < 9; ++k) {
      EXPECT_EQ(mine[static_cast<std::size_t>(k)], k < slots(shape, 3, 3) ? 0.0 : 3.5);
    }
  }
}

TEST_P(Tie, another_size_lets_the_callers_array_go_and_takes_one) {
  for (const Shape shape : kDense) {
    SCOPED_TRACE(name_of(shape));
    SmMatrix* m = typed(shape);
    const std::int64_t blocks = host().live_blocks();
    ASSERT_EQ(tie(m, data(), 3, 3, shape), SM_OK);
    EXPECT_EQ(fn().qxsmresize(m, 4, 4), SM_OK);
    EXPECT_NE(m->values, data());
    EXPECT_EQ(m->owns_values, 1);
    EXPECT_EQ(set(m, 3, 3, 9.0), SM_OK);
    for (int k = 0; k < 12; ++k) EXPECT_EQ(data()[k], k + 1.0);
    EXPECT_EQ(host().live_blocks(), blocks + 1);
    EXPECT_EQ(host().violations(), 0);
    EXPECT_EQ(fn().qxsmresize(m, 2, 2), SM_OK) << "the new array is the matrix's to give back";
    EXPECT_EQ(host().live_blocks(), blocks + 1);
  }
}

TEST_P(Tie, a_size_without_memory_lets_the_callers_array_go_too) {
  for (const std::int64_t n : {std::int64_t{4}, std::int64_t{1} << 32}) {
    SmMatrix* m = typed(kGeneralRows);
    ASSERT_EQ(tie(m, data(), 3, 3, kGeneralRows), SM_OK);
    host().fail_request(0, false);
    EXPECT_EQ(fn().qxsmresize(m, n, n), n == 4 ? SM_NO_MEMORY : SM_TOO_LARGE);
    host().stop_failing();
    EXPECT_EQ(m->values, nullptr);
    EXPECT_EQ(m->nnz, 0);
    EXPECT_EQ(set(m, 0, 0, 1.0), SM_BAD_ARGUMENT);
    EXPECT_EQ(data()[0], 1.0);
    EXPECT_EQ(fn().qxsmresize(m, 2, 2), SM_OK);
    EXPECT_EQ(m->owns_values, 1);
  }
}

TEST_P(Tie, a_tied_matrix_lets_its_array_go_when_it_is_destroyed) {
  SmMatrix* m = typed(kDiagonalRows);
  ASSERT_EQ(tie(m, data(), 3, 3, kDiagonalRows), SM_OK);
  EXPECT_EQ(fn().qxsmDestroyMatrix(instance(), &m), SM_OK);
  for (int k = 0; k < 12; ++k) EXPECT_EQ(data()[k], k + 1.0);
}

TEST_P(Tie, a_sparse_matrix_becomes_dense_without_a_trace) {
  for (const bool closed : {false, true}) {
    SmMatrix* m = square(kSymmetricSparse, 3);
    for (std::int64_t i = 0; i < 3; ++i) ASSERT_EQ(set(m, i, i, 2.0), SM_OK);
    if (closed) {
      ASSERT_EQ(fn().qxsmclose(m, 0.0), SM_OK);
      ASSERT_EQ(fn().qxsmfact(m, 0), SM_OK);
    }
    ASSERT_EQ(tie(m, data(), 3, 3, kSymmetricRows), SM_OK);
    expect_tied(m, data(), 3, 3, kSymmetricRows);
    EXPECT_EQ(m->state, SM_STATE_OPEN);
    EXPECT_EQ(m->perm, nullptr);
    EXPECT_EQ(m->work, nullptr);
    EXPECT_EQ(m->assembly_pool, nullptr);
    EXPECT_EQ(refused_at(m, 0, 0), SM_NOT_CLOSED);
    EXPECT_EQ(fn().qxsmclose(m, kNan), SM_OK);
    EXPECT_EQ(at(m, 0, 1), 2.0);
  }
  SmMatrix* g = make(kGeneralSparse, 3, 3);
  ASSERT_EQ(tie(g, data(), 3, 3, kGeneralColumns), SM_OK);
  EXPECT_EQ(g->state, SM_STATE_CLOSED);
  EXPECT_EQ(at(g, 1, 0), 2.0);
}

TEST_P(Tie, a_reset_record_is_registered_again) {
  SmMatrix* m = reset_record();
  const std::int64_t index = m->registry_index;
  ASSERT_EQ(instance()->registry[index - 1], nullptr);
  ASSERT_EQ(tie(m, data(), 3, 3, kSymmetricColumns), SM_OK);
  EXPECT_EQ(instance()->registry[index - 1], m);
  EXPECT_EQ(m->registry_index, index);
  EXPECT_EQ(m->state, SM_STATE_OPEN);
  EXPECT_EQ(refused_at(m, 0, 0), SM_NOT_CLOSED);
  EXPECT_EQ(fn().qxsmclose(m, kNan), SM_OK);
  EXPECT_EQ(at(m, 0, 0), 1.0);
}

TEST_P(Tie, a_reset_record_that_was_closed_is_readable_at_once) {
  SmMatrix* m = reset_record();
  ASSERT_EQ(fn().qxsmclose(m, 0.0), SM_OK);
  ASSERT_EQ(tie(m, data(), 3, 3, kGeneralRows), SM_OK);
  EXPECT_EQ(m->state, SM_STATE_CLOSED);
  EXPECT_EQ(at(m, 1, 0), 4.0);
}

// What a reset record takes after it was tied must be found when the instance goes: the fixture counts.
TEST_P(Tie, a_reset_record_gets_a_pool_when_an_operation_needs_one) {
  for (const Shape shape : kSquareFactored) {
    SCOPED_TRACE(name_of(shape));
    std::vector<double> mine(6, 0.0);
    for (std::int64_t i = 0; i < 3; ++i) mine[static_cast<std::size_t>(slot_of(shape, 3, 3, i, i))] = 4.0;
    SmMatrix* m = reset_record();
    ASSERT_EQ(tie(m, mine.data(), 3, 3, shape), SM_OK);
    ASSERT_EQ(fn().qxsmclose(m, 0.0), SM_OK);
    EXPECT_EQ(m->pool, nullptr);
    host().fail_request(0, false);
    EXPECT_EQ(fn().qxsmfact(m, 0), SM_NO_MEMORY);
    EXPECT_EQ(host().stop_failing(), 1);
    EXPECT_EQ(m->state, SM_STATE_CLOSED);
    host().fail_request(1, false);
    EXPECT_EQ(fn().qxsmfact(m, 0), SM_NO_MEMORY);
    host().stop_failing();
    EXPECT_EQ(fn().qxsmfact(m, 0), SM_OK);
    EXPECT_NE(m->pool, nullptr);
    double log_det = 0.0;
    EXPECT_EQ(fn().qxsmlogdet(m, &log_det), SM_OK);
    EXPECT_NEAR(log_det, std::log(64.0), 1e-14);
    for (const double value : mine) EXPECT_TRUE(value == 0.0 || value == 4.0);
    EXPECT_EQ(add(m, 1, 1, 1.0), SM_OK);
    EXPECT_EQ(m->dense_factor, nullptr);
  }
}

TEST_P(Tie, a_reset_record_gets_a_pool_for_the_one_call_solve) {
  for (const Shape shape : kPacked) {
    SCOPED_TRACE(name_of(shape));
    std::vector<double> mine(6, 0.0);
    for (std::int64_t i = 0; i < 3; ++i) mine[static_cast<std::size_t>(slot_of(shape, 3, 3, i, i))] = 4.0;
    const double b[] = {1.0, 2.0, 3.0};
    double x[3] = {};
    SmMatrix* m = reset_record();
    ASSERT_EQ(tie(m, mine.data(), 3, 3, shape), SM_OK);
    EXPECT_EQ(fn().qxsmsoldirect(m, b, x, 1), SM_OK);
    for (int i = 0; i < 3; ++i) EXPECT_NEAR(x[i], b[i] / 4.0, 1e-15);
  }
}

TEST_P(Tie, a_reset_record_can_be_sized_once_it_was_tied) {
  SmMatrix* m = reset_record();
  ASSERT_EQ(tie(m, data(), 3, 3, kGeneralColumns), SM_OK);
  host().fail_request(0, false);
  EXPECT_EQ(fn().qxsmresize(m, 4, 4), SM_NO_MEMORY);
  host().stop_failing();
  EXPECT_EQ(fn().qxsmresize(m, 4, 4), SM_OK);
  EXPECT_EQ(m->owns_values, 1);
  EXPECT_EQ(set(m, 3, 3, 1.0), SM_OK);
  for (int k = 0; k < 12; ++k) EXPECT_EQ(data()[k], k + 1.0);
}

TEST_P(Tie, a_general_sparse_record_gets_a_pool_back_for_its_factor) {
  double mine[6] = {4.0, 0.0, 4.0, 0.0, 0.0, 4.0};
  SmMatrix* m = make(kGeneralSparse, 3, 3);
  ASSERT_EQ(tie(m, mine, 3, 3, kSymmetricColumns), SM_OK);
  EXPECT_EQ(fn().qxsmfact(m, 0), SM_OK);
  EXPECT_NE(m->dense_factor, nullptr);
  EXPECT_EQ(m->rank, 3);
}

INSTANTIATE_BOTH_HOSTS(Tie);

}  // namespace
}  // namespace sm::test
