// Single elements: the order of qxsmassign's refusals, and where dense and diagonal matrices keep what they are given.
#include <gtest/gtest.h>

#include <vector>

#include "store/store_test.hpp"

namespace sm::test {
namespace {

class Assembly : public StoreTest {
 protected:
  // Every slot holds its own number, so that a changed slot shows.
  void number(SmMatrix* m) {
    for (std::int64_t k = 0; k < m->nnz; ++k) m->values[k] = static_cast<double>(k);
  }
  // Expects that `slot` holds `value` and every other slot its number.
  void expect_only(const SmMatrix* m, std::int64_t slot, double value) {
    for (std::int64_t k = 0; k < m->nnz; ++k) {
      EXPECT_EQ(m->values[k], k == slot ? value : static_cast<double>(k)) << "slot " << k;
    }
  }
  void refuse_both(SmMatrix* m, std::int64_t row, std::int64_t col, SmStatus answer) {
    EXPECT_EQ(set(m, row, col, 1.0), answer) << row << ' ' << col;
    EXPECT_EQ(add(m, row, col, 1.0), answer) << row << ' ' << col;
  }
};

TEST_P(Assembly, a_matrix_without_rows_ignores_entries_whatever_they_are) {
  for (const Shape shape : kShapes) {
    SmMatrix* m = typed(shape);
    refuse_both(m, 0, 0, SM_OK);
    refuse_both(m, -1, -1, SM_OK);
    refuse_both(m, 3, 1, SM_OK);
    refuse_both(m, kHuge, kHuge, SM_OK);
    EXPECT_EQ(m->nnz, 0);
    EXPECT_EQ(m->rank, -1) << "nothing was changed";
  }
}

TEST_P(Assembly, a_record_without_a_kind_answers_1_before_the_index_counts) {
  SmMatrix* m = reset_record();
  m->rows = 3;  // only a record that was tampered with has rows and no kind
  refuse_both(m, 0, 0, SM_UNTYPED);
  refuse_both(m, -1, 0, SM_UNTYPED);
  m->rows = 0;
}

TEST_P(Assembly, negative_indices_are_refused_before_anything_about_the_shape) {
  for (const Shape shape : kShapes) {
    SCOPED_TRACE(name_of(shape));
    SmMatrix* m = square(shape, 3);
    const std::int64_t nnz = m->nnz;
    refuse_both(m, -1, 0, SM_BAD_ARGUMENT);
    refuse_both(m, 0, -1, SM_BAD_ARGUMENT);
    refuse_both(m, 2, -1, SM_BAD_ARGUMENT);
    refuse_both(m, -1, kHuge, SM_BAD_ARGUMENT);
    refuse_both(m, -kHuge - 1, -kHuge - 1, SM_BAD_ARGUMENT);
    if (!is_sparse(shape)) {
      m->format = 24;
      refuse_both(m, -1, 0, SM_BAD_ARGUMENT);
      m->format = shape.format;
    }
    EXPECT_EQ(m->nnz, nnz);
  }
  SmMatrix* closed = square(kSymmetricSparse, 3);
  ASSERT_EQ(fn().qxsmclose(closed, 0.0), SM_OK);
  refuse_both(closed, 0, -1, SM_BAD_ARGUMENT);
}

TEST_P(Assembly, dense_elements_go_where_the_layout_says) {
  for (const Shape shape : kDense) {
    SCOPED_TRACE(name_of(shape));
    const std::int64_t cols = shape.kind == SM_KIND_GENERAL ? 5 : 4;
    SmMatrix* m = make(shape, 4, cols);
    for (std::int64_t r = 0; r < 4; ++r) {
      for (std::int64_t c = 0; c < cols; ++c) {
        const std::int64_t slot = slot_of(shape, 4, cols, r, c);
        if (slot < 0) continue;
        number(m);
        EXPECT_EQ(set(m, r, c, 100.0), SM_OK);
        expect_only(m, slot, 100.0);
        EXPECT_EQ(add(m, r, c, 0.5), SM_OK);
        expect_only(m, slot, 100.5);
        EXPECT_EQ(at(m, r, c), 100.5);
      }
    }
    EXPECT_EQ(m->nnz, slots(shape, 4, cols));
  }
}

TEST_P(Assembly, any_non_zero_flag_adds) {
  SmMatrix* m = square(kGeneralRows, 2);
  for (const std::int32_t flag : {1, -1, 2, 0x10000, std::numeric_limits<std::int32_t>::min()}) {
    EXPECT_EQ(fn().qxsmassign(m, 0, 0, flag, 1.0), SM_OK);
  }
  EXPECT_EQ(at(m, 0, 0), 5.0);
}

TEST_P(Assembly, a_general_dense_matrix_takes_any_position_inside_its_storage) {
  struct Case {
    Shape shape;
    std::int64_t row, col, slot;
  };
  const Case cases[] = {{kGeneralRows, 0, 7, 7},    {kGeneralRows, 0, 11, 11},  {kGeneralRows, 1, 5, 9},
                        {kGeneralRows, 2, 3, 11},   {kGeneralColumns, 5, 1, 8}, {kGeneralColumns, 11, 0, 11},
                        {kGeneralColumns, 4, 0, 4}, {kGeneralColumns, 2, 3, 11}};
  for (const Case& c : cases) {
    SmMatrix* m = make(c.shape, 3, 4);
    number(m);
    EXPECT_EQ(set(m, c.row, c.col, -1.0), SM_OK) << c.row << ' ' << c.col;
    expect_only(m, c.slot, -1.0);
    EXPECT_EQ(m->rows, 3);
    EXPECT_EQ(m->cols, 4);
  }
}

TEST_P(Assembly, what_would_leave_a_dense_matrix_is_refused) {
  const std::int64_t quarter = std::int64_t{1} << 62;  // times 4 is 0 in 64 bits
  for (const Shape shape : {kGeneralColumns, kGeneralRows}) {
    SCOPED_TRACE(name_of(shape));
    SmMatrix* m = square(shape, 4);
    number(m);
    for (const auto& [row, col] : {std::pair<std::int64_t, std::int64_t>{4, 3},
                                   {3, 4},
                                   {quarter, 0},
                                   {0, quarter},
                                   {quarter, quarter},
                                   {quarter, 15},
                                   {15, quarter},
                                   {SM_MAX_ELEMENTS, 0},
                                   {0, SM_MAX_ELEMENTS},
                                   {kHuge, 0},
                                   {0, kHuge},
                                   {kHuge, kHuge},
                                   {kHuge, 1}}) {
      refuse_both(m, row, col, SM_BAD_ARGUMENT);
    }
    refuse_both(m, shape.format == SM_FORMAT_ROWS ? 0 : 16, shape.format == SM_FORMAT_ROWS ? 16 : 0, SM_BAD_ARGUMENT);
    expect_only(m, -1, 0.0);
  }
}

TEST_P(Assembly, a_diagonal_matrix_takes_its_diagonal_only) {
  for (const Shape shape : {kDiagonalColumns, kDiagonalRows}) {
    SmMatrix* m = square(shape, 3);
    number(m);
    for (const auto& [row, col] : {std::pair<std::int64_t, std::int64_t>{0, 1},
                                   {1, 0},
                                   {3, 3},
                                   {2, 3},
                                   {3, 2},
                                   {kHuge, kHuge},
                                   {SM_MAX_ELEMENTS, SM_MAX_ELEMENTS}}) {
      refuse_both(m, row, col, SM_BAD_ARGUMENT);
    }
    expect_only(m, -1, 0.0);
  }
}

TEST_P(Assembly, below_the_diagonal_comes_before_the_size_and_the_state) {
  for (const Shape shape : kPacked) {
    SmMatrix* m = square(shape, 4);
    number(m);
    refuse_both(m, 2, 1, SM_OUTSIDE);
    refuse_both(m, 10, 5, SM_OUTSIDE);
    refuse_both(m, kHuge, 0, SM_OUTSIDE);
    refuse_both(m, 0, 4, SM_BAD_ARGUMENT);
    refuse_both(m, 4, 4, SM_BAD_ARGUMENT);
    refuse_both(m, 0, kHuge, SM_BAD_ARGUMENT);
    refuse_both(m, kHuge, kHuge, SM_BAD_ARGUMENT);
    refuse_both(m, 3, SM_MAX_ELEMENTS, SM_BAD_ARGUMENT);
    expect_only(m, -1, 0.0);
  }
  SmMatrix* m = square(kSymmetricSparse, 4);
  refuse_both(m, 2, 1, SM_OUTSIDE);
  refuse_both(m, kHuge, 0, SM_OUTSIDE);
  EXPECT_EQ(m->nnz, 4);
  EXPECT_EQ(m->rows, 4);
  ASSERT_EQ(fn().qxsmclose(m, 0.0), SM_OK);
  refuse_both(m, 2, 1, SM_OUTSIDE);
  refuse_both(m, 1, 2, SM_ALREADY_CLOSED);
  refuse_both(m, 1, 1, SM_ALREADY_CLOSED);
  refuse_both(m, 0, 100, SM_ALREADY_CLOSED);
  refuse_both(m, 0, kHuge, SM_ALREADY_CLOSED);
  EXPECT_EQ(m->rows, 4);
}

TEST_P(Assembly, a_format_that_does_not_exist_answers_124) {
  for (const Shape shape : {kGeneralRows, kSymmetricRows}) {
    SmMatrix* m = square(shape, 3);
    number(m);
    m->format = 24;
    refuse_both(m, 1, 1, SM_UNAVAILABLE);
    expect_only(m, -1, 0.0);
    m->format = shape.format;
  }
}

TEST_P(Assembly, refused_elements_leave_rank_and_log_determinant) {
  for (const Shape shape : kSquareFactored) {
    SmMatrix* m = definite(shape);
    ASSERT_EQ(fn().qxsmfact(m, 0), SM_OK);
    const double* factor = m->dense_factor;
    refuse_both(m, -1, 0, SM_BAD_ARGUMENT);
    refuse_both(m, 0, 3, SM_BAD_ARGUMENT);
    refuse_both(m, 2, 1, shape.kind == SM_KIND_DIAGONAL ? SM_BAD_ARGUMENT : SM_OUTSIDE);
    EXPECT_EQ(m->state, SM_STATE_FACTORED);
    EXPECT_EQ(m->dense_factor, factor);
    EXPECT_EQ(m->rank, 3);
    EXPECT_FALSE(is_missing(m->log_det));
  }
}

TEST_P(Assembly, values_are_stored_to_the_bit) {
  const double missing = [] {
    const std::uint64_t pattern = SM_MISSING_BITS;
    double out = 0.0;
    static_assert(sizeof out == sizeof pattern);
    __builtin_memcpy(&out, &pattern, sizeof out);
    return out;
  }();
  for (const Shape shape : {kGeneralRows, kGeneralSparse, kSymmetricRows, kDiagonalRows}) {
    SmMatrix* m = square(shape, 3);
    for (const double value : {-0.0, kInfinity, -kInfinity, missing, 5e-324, 1.0 / 3.0}) {
      EXPECT_EQ(set(m, 1, 1, value), SM_OK);
      EXPECT_EQ(bits(at(m, 1, 1)), bits(value));
    }
  }
}

TEST_P(Assembly, removal_refuses_in_order) {
  SmMatrix* empty = make(kGeneralSparse, 3, 3);
  EXPECT_EQ(qxsmremove(empty, -1, 7), SM_OK);
  SmMatrix* none = reset_record();
  EXPECT_EQ(qxsmremove(none, -1, 7), SM_OK);
  none->nnz = 1;  // only a record that was tampered with has entries and no kind
  EXPECT_EQ(qxsmremove(none, -1, 7), SM_UNTYPED);
  none->nnz = 0;
  for (const Shape shape : kShapes) {
    SCOPED_TRACE(name_of(shape));
    SmMatrix* m = square(shape, 3);
    ASSERT_EQ(set(m, 1, 1, 2.0), SM_OK);
    for (const std::int64_t bad : {std::int64_t{-1}, std::int64_t{3}, SM_MAX_ELEMENTS, kHuge, -kHuge - 1}) {
      EXPECT_EQ(qxsmremove(m, bad, 0), SM_OUTSIDE) << bad;
      EXPECT_EQ(qxsmremove(m, 0, bad), SM_OUTSIDE) << bad;
    }
    const std::int64_t nnz = m->nnz;
    const bool can = shape.kind == SM_KIND_GENERAL && is_sparse(shape);
    EXPECT_EQ(qxsmremove(m, 1, 1), can ? SM_OK : SM_UNAVAILABLE);
    EXPECT_EQ(m->nnz, can ? nnz - 1 : nnz);
  }
}

INSTANTIATE_BOTH_HOSTS(Assembly);

}  // namespace
}  // namespace sm::test
