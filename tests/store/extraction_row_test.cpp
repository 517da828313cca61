// One row of a matrix, from a column on: qxsmrow.
#include <gtest/gtest.h>

#include "cholesky/cholesky_support.hpp"
#include "store/filled.hpp"

namespace sm::test {
namespace {

class RowExtraction : public ModuleTest {
 protected:
  std::vector<double> row(SmMatrix* m, std::int64_t r, std::int64_t start) {
    Output out(m->cols);
    EXPECT_EQ(qxsmrow(m, r, out.data(), start), SM_OK) << r << " from " << start;
    return out.values();
  }
  void expect_rows(const Filled& a) {
    for (std::int64_t r = 0; r < a.dense.rows(); ++r) {
      for (std::int64_t start = -1; start <= a.dense.cols() + 1; ++start) {
        EXPECT_EQ(row(a.matrix, r, start), row_from(a.shape, a.dense, r, start))
            << name_of(a.shape) << ", row " << r << " from " << start;
      }
    }
  }
  // The first three rows of upper = {1, 2, 3; 4, 5; 6}.
  Filled counting(Shape shape) {
    return filled_with(session(), shape, 3, 3,
                       {{{0, 0}, 1.0}, {{0, 1}, 2.0}, {{0, 2}, 3.0}, {{1, 1}, 4.0}, {{1, 2}, 5.0}, {{2, 2}, 6.0}});
  }
};

TEST_P(RowExtraction, every_row_of_every_square_matrix_comes_from_every_start) {
  Random random(1);
  for (const Shape shape : kShapes) {
    for (const std::int64_t n : {1, 2, 3, 7, 24}) expect_rows(filled(session(), shape, n, n, random));
  }
}

TEST_P(RowExtraction, every_row_of_a_matrix_that_is_not_square_has_its_own_length) {
  Random random(2);
  for (const Shape shape : {kGeneralSparse, kGeneralColumns, kGeneralRows}) {
    expect_rows(filled(session(), shape, 1, 9, random));
    expect_rows(filled(session(), shape, 9, 1, random));
    expect_rows(filled(session(), shape, 4, 6, random));
    expect_rows(filled(session(), shape, 23, 3, random));
  }
}

TEST_P(RowExtraction, a_start_far_outside_is_the_first_column_or_behind_the_last) {
  Random random(3);
  for (const Shape shape : kShapes) {
    const Filled a = filled(session(), shape, 4, 4, random);
    for (std::int64_t r = 0; r < 4; ++r) {
      EXPECT_EQ(row(a.matrix, r, -kHuge - 1), row_from(shape, a.dense, r, 0)) << name_of(shape);
      EXPECT_EQ(row(a.matrix, r, kHuge), row_from(shape, a.dense, r, 4)) << name_of(shape);
    }
  }
}

TEST_P(RowExtraction, a_general_matrix_by_rows_moves_what_it_gives_to_the_beginning) {
  Random random(4);
  SmMatrix* m = filled_with(session(), kGeneralRows, 2, 4,
                            {{{0, 0}, 1.0}, {{1, 0}, 5.0}, {{1, 1}, 6.0}, {{1, 2}, 7.0}, {{1, 3}, 8.0}})
                    .matrix;
  EXPECT_EQ(row(m, 1, 0), (std::vector<double>{5.0, 6.0, 7.0, 8.0}));
  EXPECT_EQ(row(m, 1, 1), (std::vector<double>{6.0, 7.0, 8.0, 0.0}));
  EXPECT_EQ(row(m, 1, 3), (std::vector<double>{8.0, 0.0, 0.0, 0.0}));
  EXPECT_EQ(row(m, 1, 4), (std::vector<double>(4, 0.0)));
}

TEST_P(RowExtraction, other_general_matrices_keep_every_column_at_its_place) {
  for (const Shape shape : {kGeneralSparse, kGeneralColumns}) {
    SmMatrix* m =
        filled_with(session(), shape, 2, 4, {{{1, 0}, 5.0}, {{1, 1}, 6.0}, {{1, 2}, 7.0}, {{1, 3}, 8.0}}).matrix;
    EXPECT_EQ(row(m, 1, 1), (std::vector<double>{0.0, 6.0, 7.0, 8.0})) << name_of(shape);
    EXPECT_EQ(row(m, 1, 3), (std::vector<double>{0.0, 0.0, 0.0, 8.0})) << name_of(shape);
  }
}

TEST_P(RowExtraction, a_symmetric_matrix_by_columns_moves_what_lies_up_to_the_diagonal) {
  SmMatrix* m = counting(kSymmetricColumns).matrix;
  EXPECT_EQ(row(m, 2, 0), (std::vector<double>{3.0, 5.0, 6.0}));
  EXPECT_EQ(row(m, 2, 1), (std::vector<double>{5.0, 6.0, 0.0}));
  EXPECT_EQ(row(m, 2, 2), (std::vector<double>{6.0, 0.0, 0.0}));
  EXPECT_EQ(row(m, 1, 1), (std::vector<double>{4.0, 0.0, 5.0}));
  EXPECT_EQ(row(m, 1, 2), (std::vector<double>{0.0, 0.0, 5.0}));
  EXPECT_EQ(row(m, 0, 2), (std::vector<double>{0.0, 2.0, 3.0}));
}

TEST_P(RowExtraction, other_symmetric_matrices_give_the_stored_row_whatever_the_start_is) {
  for (const Shape shape : {kSymmetricSparse, kSymmetricRows}) {
    SmMatrix* m = counting(shape).matrix;
    EXPECT_EQ(row(m, 0, 0), (std::vector<double>{1.0, 2.0, 3.0})) << name_of(shape);
    EXPECT_EQ(row(m, 2, 0), (std::vector<double>{3.0, 5.0, 6.0})) << name_of(shape);
    EXPECT_EQ(row(m, 2, 1), (std::vector<double>{0.0, 5.0, 6.0})) << name_of(shape);
    EXPECT_EQ(row(m, 1, 2), (std::vector<double>{0.0, 4.0, 5.0})) << name_of(shape);
    EXPECT_EQ(row(m, 1, 3), (std::vector<double>{0.0, 4.0, 5.0})) << name_of(shape);
  }
}

TEST_P(RowExtraction, a_diagonal_matrix_gives_its_element_whatever_the_start_is) {
  for (const Shape shape : {kDiagonalColumns, kDiagonalRows}) {
    SmMatrix* m = filled_with(session(), shape, 3, 3, {{{0, 0}, 1.0}, {{1, 1}, 2.0}, {{2, 2}, 3.0}}).matrix;
    EXPECT_EQ(row(m, 1, 0), (std::vector<double>{0.0, 2.0, 0.0}));
    EXPECT_EQ(row(m, 1, 2), (std::vector<double>{0.0, 2.0, 0.0}));
    EXPECT_EQ(row(m, 0, kHuge), (std::vector<double>{1.0, 0.0, 0.0}));
  }
}

TEST_P(RowExtraction, the_column_above_the_diagonal_is_found_in_rows_of_every_length) {
  constexpr std::int64_t n = 70;
  Nonzeros elements;
  for (std::int64_t r = 0; r < n; ++r)
    for (std::int64_t c = r + 1; c < n; ++c)
      // Row 5 holds its diagonal alone, row 6 nothing behind column 20, row 7 everything.
      if (r == 7 || (r != 5 && (r != 6 || c < 20) && (c * 7 + r * 3) % (1 + r % 6) == 0)) {
        elements[{r, c}] = static_cast<double>(100 * r + c);
      }
  expect_rows(filled_with(session(), kSymmetricSparse, n, n, elements));
}

TEST_P(RowExtraction, an_ordered_matrix_is_read_in_the_callers_order) {
  Random random(5);
  const Filled a = filled_definite(session(), kSymmetricSparse, 15, random);
  ASSERT_EQ(bring_to(a.matrix, SM_STATE_ORDERED), SM_OK);
  expect_rows(a);
}

TEST_P(RowExtraction, a_factored_or_inverted_matrix_with_an_array_of_its_own_shows_its_values) {
  Random random(6);
  for (const Shape shape : kSquareFactored) {
    const Filled a = filled_definite(session(), shape, 6, random);
    ASSERT_EQ(fn().qxsmfact(a.matrix, 0), SM_OK);
    expect_rows(a);
    ASSERT_EQ(fn().qxsminv(a.matrix, 0, kNan), SM_OK);
    ASSERT_EQ(a.matrix->state, SM_STATE_INVERTED);
    expect_rows(a);
  }
}

TEST_P(RowExtraction, a_matrix_without_entries_answers_0_and_leaves_the_output) {
  Output out(3);
  for (const Shape shape : kShapes) {
    EXPECT_EQ(qxsmrow(new_sized(session(), shape, 0, 0), 5, out.data(), 0), SM_OK) << name_of(shape);
  }
  EXPECT_EQ(qxsmrow(new_sized(session(), kGeneralSparse, 3, 3), 5, out.data(), 0), SM_OK);
  EXPECT_EQ(qxsmrow(new_untyped(session()), 5, out.data(), 0), SM_OK);
  EXPECT_TRUE(out.untouched());
}

TEST_P(RowExtraction, kind_then_state_then_row_are_checked_before_the_output_is_touched) {
  Output out(3);
  EXPECT_EQ(qxsmrow(new_untyped_with_an_entry(session()), 5, out.data(), 0), SM_UNTYPED);
  for (const Shape shape : kShapes) {
    const Unclosed open = unclosed(session(), shape);
    EXPECT_EQ(qxsmrow(open.matrix, 0, out.data(), 0), SM_NOT_CLOSED) << name_of(shape);
    EXPECT_EQ(qxsmrow(open.matrix, -1, out.data(), 0), SM_NOT_CLOSED) << name_of(shape);
  }
  EXPECT_EQ(qxsmrow(new_without_rows(session(), 3), 7, out.data(), 0), SM_NOT_CLOSED);
  Random random(7);
  for (const Shape shape : kShapes) {
    SmMatrix* m = filled(session(), shape, 3, 3, random).matrix;
    for (const std::int64_t bad : {std::int64_t{-1}, std::int64_t{3}, kHuge, -kHuge - 1}) {
      EXPECT_EQ(qxsmrow(m, bad, out.data(), 0), SM_OUTSIDE) << name_of(shape) << ", row " << bad;
    }
  }
  EXPECT_TRUE(out.untouched());
}

TEST_P(RowExtraction, a_reordered_matrix_answers_118_with_the_output_cleared) {
  Random random(8);
  for (const std::int32_t state : {SM_STATE_REORDERED, SM_STATE_SYMBOLIC, SM_STATE_FACTORED}) {
    const Filled a = filled_definite(session(), kSymmetricSparse, 5, random);
    ASSERT_EQ(bring_to(a.matrix, state), SM_OK);
    Output untouched(5);
    EXPECT_EQ(qxsmrow(a.matrix, 5, untouched.data(), 0), SM_OUTSIDE) << "the row is checked first";
    EXPECT_TRUE(untouched.untouched());
    Output out(5);
    EXPECT_EQ(qxsmrow(a.matrix, 2, out.data(), 0), SM_REORDERED);
    EXPECT_TRUE(out.cleared());
    EXPECT_EQ(qxsmrow(a.matrix, 2, out.data(), 4), SM_REORDERED);
  }
}

TEST_P(RowExtraction, another_kind_answers_124_and_another_symmetric_format_zeros) {
  Random random(9);
  SmMatrix* m = filled(session(), kSymmetricRows, 3, 3, random).matrix;
  Output out(3);
  m->kind = 4;
  EXPECT_EQ(qxsmrow(m, 3, out.data(), 0), SM_OUTSIDE);
  EXPECT_TRUE(out.untouched());
  EXPECT_EQ(qxsmrow(m, 1, out.data(), 0), SM_UNAVAILABLE);
  EXPECT_TRUE(out.cleared());
  m->kind = SM_KIND_SYMMETRIC;
  m->format = 24;
  Output zeros(3);
  EXPECT_EQ(qxsmrow(m, 1, zeros.data(), 0), SM_OK);
  EXPECT_TRUE(zeros.cleared());
  m->format = SM_FORMAT_ROWS;
}

INSTANTIATE_BOTH_HOSTS(RowExtraction);

}  // namespace
}  // namespace sm::test
