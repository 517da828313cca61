// The diagonal, and whether there is anything beside it: qxsmdiag and qxsmIsDiag.
#include <gtest/gtest.h>

#include <algorithm>

#include "cholesky/cholesky_support.hpp"
#include "store/filled.hpp"

namespace sm::test {
namespace {

class DiagonalExtraction : public ModuleTest {
 protected:
  void expect_every_range(const Filled& a) {
    const std::int64_t m = std::min(a.dense.rows(), a.dense.cols());
    for (std::int64_t first = 0; first < m; ++first)
      for (std::int64_t last = first; last < m; ++last) {
        std::vector<double> expected;
        for (std::int64_t i = first; i <= last; ++i) expected.push_back(static_cast<double>(a.dense(i, i)));
        Output out(last - first + 1);
        EXPECT_EQ(fn().qxsmdiag(a.matrix, out.data(), first, last), SM_OK);
        EXPECT_EQ(out.values(), expected) << name_of(a.shape) << ' ' << first << ".." << last;
      }
  }
  // The flag, which stands between words that must stay.
  SmStatus is_diagonal(SmMatrix* m, double tolerance, int* answer) {
    std::int16_t flag[3] = {77, 77, 77};
    const SmStatus status = fn().qxsmIsDiag(m, &flag[1], tolerance);
    EXPECT_EQ(flag[0], 77);
    EXPECT_EQ(flag[2], 77);
    *answer = flag[1];
    return status;
  }
  int flag_of(SmMatrix* m, double tolerance) {
    int answer = -1;
    EXPECT_EQ(is_diagonal(m, tolerance, &answer), SM_OK);
    return answer;
  }
  // 5 x 5 with one element beside the diagonal, at `place` where the shape has it.
  SmMatrix* with_one_off(Shape shape, std::pair<std::int64_t, std::int64_t> place, double value) {
    Nonzeros elements{{place, value}};
    for (std::int64_t i = 0; i < 5; ++i) elements[{i, i}] = 1.0 + static_cast<double>(i);
    return filled_with(session(), shape, 5, 5, elements).matrix;
  }
};

constexpr Shape kWithOffDiagonal[] = {kGeneralSparse,   kGeneralColumns,   kGeneralRows,
                                      kSymmetricSparse, kSymmetricColumns, kSymmetricRows};

TEST_P(DiagonalExtraction, every_range_of_every_square_diagonal_is_read) {
  Random random(1);
  for (const Shape shape : kShapes) {
    for (const std::int64_t n : {1, 2, 6, 13}) expect_every_range(filled(session(), shape, n, n, random));
  }
}

TEST_P(DiagonalExtraction, a_matrix_that_is_not_square_has_a_diagonal_of_its_shorter_side) {
  Random random(2);
  for (const Shape shape : {kGeneralSparse, kGeneralColumns, kGeneralRows}) {
    expect_every_range(filled(session(), shape, 3, 5, random));
    expect_every_range(filled(session(), shape, 7, 2, random));
    SmMatrix* m = filled_with(session(), shape, 3, 5, {{{2, 2}, 4.0}, {{1, 4}, 1.0}}).matrix;
    Output out(1);
    EXPECT_EQ(fn().qxsmdiag(m, out.data(), 2, 2), SM_OK);
    EXPECT_EQ(out.values()[0], 4.0);
    EXPECT_EQ(fn().qxsmdiag(m, out.data(), 3, 3), SM_OUTSIDE) << "columns 3 and 4 have no diagonal element";
  }
}

TEST_P(DiagonalExtraction, the_diagonal_of_a_sparse_matrix_is_read_in_every_state) {
  Random random(3);
  for (std::int32_t state = SM_STATE_CLOSED; state <= SM_STATE_FACTORED; ++state) {
    const Filled a = filled_definite(session(), kSymmetricSparse, 9, random);
    ASSERT_EQ(bring_to(a.matrix, state), SM_OK);
    expect_every_range(a);
  }
}

TEST_P(DiagonalExtraction, a_factored_or_inverted_matrix_shows_the_diagonal_of_its_values) {
  Random random(4);
  for (const Shape shape : kSquareFactored) {
    const Filled a = filled_definite(session(), shape, 5, random);
    ASSERT_EQ(fn().qxsmfact(a.matrix, 0), SM_OK);
    expect_every_range(a);
    ASSERT_EQ(fn().qxsminv(a.matrix, 0, kNan), SM_OK);
    expect_every_range(a);
  }
}

TEST_P(DiagonalExtraction, emptiness_kind_state_and_range_are_checked_before_the_output_is_touched) {
  Output out(3);
  for (const Shape shape : kShapes) {
    EXPECT_EQ(fn().qxsmdiag(new_sized(session(), shape, 0, 0), out.data(), 5, 1), SM_OK) << name_of(shape);
    const Unclosed open = unclosed(session(), shape);
    EXPECT_EQ(fn().qxsmdiag(open.matrix, out.data(), 5, 1), SM_NOT_CLOSED) << name_of(shape);
  }
  EXPECT_EQ(fn().qxsmdiag(new_sized(session(), kGeneralSparse, 3, 3), out.data(), -1, 9), SM_OK);
  EXPECT_EQ(fn().qxsmdiag(new_untyped(session()), out.data(), 0, 0), SM_OK);
  EXPECT_EQ(fn().qxsmdiag(new_untyped_with_an_entry(session()), out.data(), 5, 1), SM_UNTYPED);
  EXPECT_EQ(fn().qxsmdiag(new_without_rows(session(), 3), out.data(), 5, 1), SM_NOT_CLOSED);
  Random random(5);
  using Range = std::pair<std::int64_t, std::int64_t>;
  for (const Shape shape : kShapes) {
    SmMatrix* m = filled(session(), shape, 3, 3, random).matrix;
    for (const auto& [first, last] : {Range{-1, 2}, Range{0, 3}, Range{2, 1}, Range{3, 3}, Range{-2, -1}, Range{0, -1},
                                      Range{kHuge, kHuge}, Range{-kHuge - 1, kHuge}, Range{0, kHuge}}) {
      EXPECT_EQ(fn().qxsmdiag(m, out.data(), first, last), SM_OUTSIDE) << name_of(shape) << ' ' << first << ' ' << last;
    }
  }
  EXPECT_TRUE(out.untouched());
}

TEST_P(DiagonalExtraction, another_kind_answers_124_with_the_output_cleared) {
  Random random(6);
  SmMatrix* m = filled(session(), kGeneralRows, 3, 3, random).matrix;
  m->kind = 4;
  Output out(3);
  EXPECT_EQ(fn().qxsmdiag(m, out.data(), 0, 3), SM_OUTSIDE);
  EXPECT_TRUE(out.untouched());
  EXPECT_EQ(fn().qxsmdiag(m, out.data(), 0, 2), SM_UNAVAILABLE);
  EXPECT_TRUE(out.cleared());
  int answer = -1;
  EXPECT_EQ(is_diagonal(m, 0.0, &answer), SM_OK);
  EXPECT_EQ(answer, 0);
}

TEST_P(DiagonalExtraction, an_element_beside_the_diagonal_counts_when_it_is_above_the_tolerance) {
  using Place = std::pair<std::int64_t, std::int64_t>;
  for (const Shape shape : kWithOffDiagonal) {
    SCOPED_TRACE(name_of(shape));
    for (const Place& place : {Place{0, 1}, Place{0, 4}, Place{2, 3}, Place{3, 4}, Place{4, 0}, Place{3, 2}}) {
      if (shape.kind == SM_KIND_SYMMETRIC && place.first > place.second) continue;
      for (const double value : {0.5, -0.5}) {
        SmMatrix* m = with_one_off(shape, place, value);
        EXPECT_EQ(flag_of(m, 0.0), 0) << place.first << ' ' << place.second;
        EXPECT_EQ(flag_of(m, 0.25), 0);
        EXPECT_EQ(flag_of(m, 0.5), 1) << "at the tolerance it is small";
        EXPECT_EQ(flag_of(m, 0.75), 1);
        EXPECT_EQ(flag_of(m, kNan), 0) << "a NaN is 0";
      }
    }
    EXPECT_EQ(flag_of(with_one_off(shape, {1, 2}, 1e-4), 1e-3), 1);
    EXPECT_EQ(flag_of(with_one_off(shape, {1, 2}, 1e-4), 1e-5), 0);
  }
}

TEST_P(DiagonalExtraction, a_stored_zero_is_small_unless_the_tolerance_is_negative) {
  for (const Shape shape : kWithOffDiagonal) {
    SmMatrix* m = with_one_off(shape, {1, 3}, 0.0);
    EXPECT_EQ(flag_of(m, 0.0), 1) << name_of(shape);
    EXPECT_EQ(flag_of(m, kNan), 1) << name_of(shape);
    EXPECT_EQ(flag_of(m, -1.0), 0) << name_of(shape);
  }
  for (const Shape shape : {kGeneralSparse, kSymmetricSparse}) {
    EXPECT_EQ(flag_of(with_one_off(shape, {2, 2}, 9.0), -1.0), 1) << "nothing is stored beside the diagonal";
  }
}

TEST_P(DiagonalExtraction, an_infinity_is_large_and_a_nan_is_not) {
  for (const Shape shape : kWithOffDiagonal) {
    EXPECT_EQ(flag_of(with_one_off(shape, {1, 3}, kInfinity), 1e300), 0) << name_of(shape);
    EXPECT_EQ(flag_of(with_one_off(shape, {1, 3}, -kInfinity), 1e300), 0) << name_of(shape);
    EXPECT_EQ(flag_of(with_one_off(shape, {1, 3}, kInfinity), kInfinity), 1) << name_of(shape);
    EXPECT_EQ(flag_of(with_one_off(shape, {1, 3}, kNan), 0.0), 1) << name_of(shape);
    EXPECT_EQ(flag_of(with_one_off(shape, {1, 1}, kInfinity), 0.0), 1) << "the diagonal itself does not count";
  }
}

TEST_P(DiagonalExtraction, a_diagonal_matrix_is_one_whatever_its_state) {
  Random random(7);
  for (const Shape shape : {kDiagonalColumns, kDiagonalRows}) {
    EXPECT_EQ(flag_of(filled(session(), shape, 4, 4, random).matrix, -1.0), 1);
    const Unclosed open = unclosed(session(), shape);
    EXPECT_EQ(flag_of(open.matrix, 0.0), 1);
    EXPECT_EQ(flag_of(new_sized(session(), shape, 0, 0), 0.0), 0) << "an empty one is not";
  }
}

TEST_P(DiagonalExtraction, a_reordered_matrix_is_judged_by_all_it_stores) {
  Random random(8);
  for (std::int32_t state = SM_STATE_ORDERED; state <= SM_STATE_FACTORED; ++state) {
    for (const double off : {0.0, 0.25}) {
      Nonzeros elements{{{1, 4}, off}, {{0, 2}, 0.125}};
      for (std::int64_t i = 0; i < 6; ++i) elements[{i, i}] = 4.0;
      SmMatrix* m = filled_with(session(), kSymmetricSparse, 6, 6, elements).matrix;
      ASSERT_EQ(bring_to(m, state), SM_OK);
      EXPECT_EQ(flag_of(m, 0.125), off == 0.0 ? 1 : 0) << "state " << state;
      EXPECT_EQ(flag_of(m, 0.0), 0);
    }
  }
}

TEST_P(DiagonalExtraction, the_flag_is_cleared_before_emptiness_kind_state_and_shape_are_checked) {
  int answer = -1;
  for (const Shape shape : kWithOffDiagonal) {
    EXPECT_EQ(is_diagonal(new_sized(session(), shape, 0, 0), 0.0, &answer), SM_OK);
    EXPECT_EQ(answer, 0) << name_of(shape);
    const Unclosed open = unclosed(session(), shape);
    open.matrix->cols = 4;  // not square either
    EXPECT_EQ(is_diagonal(open.matrix, 0.0, &answer), SM_NOT_CLOSED) << name_of(shape);
    EXPECT_EQ(answer, 0);
    open.matrix->cols = 3;
  }
  EXPECT_EQ(is_diagonal(new_sized(session(), kGeneralSparse, 3, 5), 0.0, &answer), SM_OK) << "empty before its shape";
  EXPECT_EQ(answer, 0);
  EXPECT_EQ(is_diagonal(new_untyped(session()), 0.0, &answer), SM_OK);
  EXPECT_EQ(answer, 0);
  EXPECT_EQ(is_diagonal(new_untyped_with_an_entry(session()), 0.0, &answer), SM_KIND_MISMATCH);
  EXPECT_EQ(answer, 0);
  EXPECT_EQ(is_diagonal(new_without_rows(session(), 3), 0.0, &answer), SM_NOT_CLOSED);
  EXPECT_EQ(answer, 0);
  for (const Shape shape : {kGeneralSparse, kGeneralColumns, kGeneralRows}) {
    SmMatrix* m = filled_with(session(), shape, 3, 4, {{{1, 1}, 2.0}}).matrix;
    EXPECT_EQ(is_diagonal(m, 0.0, &answer), SM_DIMENSION_MISMATCH) << name_of(shape);
    EXPECT_EQ(answer, 0);
  }
}

INSTANTIATE_BOTH_HOSTS(DiagonalExtraction);

}  // namespace
}  // namespace sm::test
