// The trace of one matrix: qxsmtrace.
#include <gtest/gtest.h>

#include <algorithm>

#include "cholesky/cholesky_support.hpp"
#include "store/filled.hpp"

namespace sm::test {
namespace {

class Trace : public ModuleTest {
 protected:
  // The result, which stands between words that must stay.
  SmStatus trace(SmMatrix* a, double* result) {
    Output out(1);
    const SmStatus status = fn().qxsmtrace(a, out.data());
    *result = out.values()[0];
    return status;
  }
  double trace_of(SmMatrix* a) {
    double result = 0.0;
    EXPECT_EQ(trace(a, &result), SM_OK);
    return result;
  }
  // The status of a refusal, which must leave the missing value.
  SmStatus refused(SmMatrix* a) {
    double result = 0.0;
    const SmStatus status = trace(a, &result);
    EXPECT_TRUE(is_missing(result)) << "status " << status;
    return status;
  }
  static double expected(const Filled& a) {
    double sum = 0.0;
    for (std::int64_t i = 0; i < std::min(a.dense.rows(), a.dense.cols()); ++i) {
      sum += static_cast<double>(a.dense(i, i));
    }
    return sum;
  }
};

TEST_P(Trace, the_diagonal_of_every_shape_and_size_is_summed) {
  Random random(1);
  for (const Shape shape : kShapes) {
    for (const std::int64_t n : {1, 2, 3, 10, 50}) {
      const Filled a = filled(session(), shape, n, n, random);
      EXPECT_EQ(trace_of(a.matrix), expected(a)) << name_of(shape) << ", order " << n;
    }
  }
}

TEST_P(Trace, a_matrix_that_is_not_square_has_the_diagonal_of_its_shorter_side) {
  Random random(2);
  for (const Shape shape : {kGeneralSparse, kGeneralColumns, kGeneralRows}) {
    for (const auto& [rows, cols] : {std::pair<std::int64_t, std::int64_t>{3, 5}, {5, 3}, {1, 9}, {9, 1}, {2, 40}}) {
      const Filled a = filled(session(), shape, rows, cols, random);
      EXPECT_EQ(trace_of(a.matrix), expected(a)) << name_of(shape) << ' ' << rows << " x " << cols;
    }
    const Filled b = filled_with(session(), shape, 3, 5,
                                 {{{0, 0}, 1.0}, {{1, 1}, 2.0}, {{2, 2}, 4.0}, {{2, 3}, 8.0}, {{2, 4}, 16.0}});
    EXPECT_EQ(trace_of(b.matrix), 7.0) << "three elements";
  }
}

TEST_P(Trace, rows_without_a_diagonal_element_add_nothing) {
  SmMatrix* a = filled_with(session(), kGeneralSparse, 5, 5, {{{0, 1}, 9.0}, {{1, 1}, 2.5}, {{4, 0}, 9.0}}).matrix;
  EXPECT_EQ(trace_of(a), 2.5);
  ASSERT_EQ(fn().qxsmassign(a, 30, 30, 0, 0.25), SM_OK);
  EXPECT_EQ(trace_of(a), 2.75) << "the matrix has grown";
  ASSERT_EQ(qxsmremove(a, 1, 1), SM_OK);
  EXPECT_EQ(trace_of(a), 0.25);
}

TEST_P(Trace, the_elements_are_summed_in_order) {
  Nonzeros elements{{{0, 0}, 1.0}, {{1, 1}, 1e100}, {{2, 2}, 1.0}, {{3, 3}, -1e100}, {{4, 4}, 0.5}};
  for (const Shape shape : kShapes) {
    EXPECT_EQ(trace_of(filled_with(session(), shape, 5, 5, elements).matrix), 0.5) << name_of(shape);
  }
}

TEST_P(Trace, infinities_and_nans_show) {
  for (const Shape shape : kShapes) {
    EXPECT_EQ(trace_of(filled_with(session(), shape, 3, 3, {{{1, 1}, kInfinity}}).matrix), kInfinity) << name_of(shape);
    const double sum =
        trace_of(filled_with(session(), shape, 3, 3, {{{0, 0}, kInfinity}, {{2, 2}, -kInfinity}}).matrix);
    EXPECT_NE(sum, sum) << name_of(shape);
  }
}

TEST_P(Trace, a_matrix_is_summed_in_every_state) {
  Random random(3);
  for (std::int32_t state = SM_STATE_CLOSED; state <= SM_STATE_FACTORED; ++state) {
    const Filled a = filled_definite(session(), kSymmetricSparse, 14, random);
    ASSERT_EQ(bring_to(a.matrix, state), SM_OK);
    EXPECT_EQ(trace_of(a.matrix), expected(a)) << state;
  }
  for (const Shape shape : kSquareFactored) {
    const Filled a = filled_definite(session(), shape, 6, random);
    ASSERT_EQ(fn().qxsmfact(a.matrix, 0), SM_OK);
    EXPECT_EQ(trace_of(a.matrix), expected(a)) << name_of(shape);
    ASSERT_EQ(fn().qxsminv(a.matrix, 0, kNan), SM_OK);
    EXPECT_EQ(trace_of(a.matrix), expected(a)) << name_of(shape);
  }
}

TEST_P(Trace, a_matrix_without_entries_or_kind_answers_100) {
  for (const Shape shape : kShapes) {
    SmMatrix* a = new_sized(session(), shape, 0, 0);
    EXPECT_EQ(refused(a), SM_NOTHING_TO_REPORT) << name_of(shape);
    a->state = SM_STATE_OPEN;
    EXPECT_EQ(refused(a), SM_NOTHING_TO_REPORT) << "before the state is looked at";
  }
  EXPECT_EQ(refused(new_sized(session(), kGeneralSparse, 3, 3)), SM_NOTHING_TO_REPORT);
  EXPECT_EQ(refused(new_untyped(session())), SM_NOTHING_TO_REPORT);
  EXPECT_EQ(refused(new_untyped_with_an_entry(session())), SM_NOTHING_TO_REPORT);
}

TEST_P(Trace, a_matrix_that_is_not_closed_answers_113) {
  for (const Shape shape : kShapes) {
    const Unclosed a = unclosed(session(), shape);
    EXPECT_EQ(refused(a.matrix), SM_NOT_CLOSED) << name_of(shape);
    const std::int32_t kind = a.matrix->kind;
    a.matrix->kind = 9;
    EXPECT_EQ(refused(a.matrix), SM_NOT_CLOSED) << "before the kind is looked at";
    a.matrix->kind = kind;
  }
  EXPECT_EQ(refused(new_without_rows(session(), 3)), SM_NOT_CLOSED);
}

TEST_P(Trace, another_kind_answers_110_and_another_format_124) {
  Random random(4);
  for (const Shape shape : {kGeneralRows, kSymmetricRows}) {
    SmMatrix* a = filled(session(), shape, 3, 3, random).matrix;
    a->format = 24;
    EXPECT_EQ(refused(a), SM_UNAVAILABLE) << name_of(shape);
    a->kind = 9;
    EXPECT_EQ(refused(a), SM_KIND_MISMATCH) << "whatever the format is";
    a->kind = shape.kind;
    a->format = shape.format;
  }
}

INSTANTIATE_BOTH_HOSTS(Trace);

}  // namespace
}  // namespace sm::test
