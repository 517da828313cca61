// What the trace of a product with an inverse answers when it cannot be had, and in which order: qxsmtraceinvAB.
#include <gtest/gtest.h>

#include "cholesky/cholesky_support.hpp"
#include "trace/trace_refusals.hpp"

namespace sm::test {
namespace {

class InverseTraceRefusals : public TraceRefusals {
 protected:
  SmStatus trace(SmMatrix* a, SmMatrix* b, std::int64_t start, double* result) {
    Output out(1);
    const SmStatus status = qxsmtraceinvAB(a, b, start, out.data());
    *result = out.values()[0];
    return status;
  }
  // The status of a call that must leave the missing value.
  SmStatus refused(SmMatrix* a, SmMatrix* b, std::int64_t start = 0) {
    double result = 0.0;
    const SmStatus status = trace(a, b, start, &result);
    EXPECT_TRUE(is_missing(result)) << "status " << status << ", result " << result;
    return status;
  }
  // The status of a call that ends in the sum, which must be `sum` by then.
  SmStatus ended(SmMatrix* a, SmMatrix* b, std::int64_t start, double sum) {
    double result = -1.0;
    const SmStatus status = trace(a, b, start, &result);
    EXPECT_EQ(result, sum) << "status " << status;
    return status;
  }
  SmMatrix* definite(Shape shape, std::int64_t n) {
    Random random(2);
    return filled_definite(session(), shape, n, random).matrix;
  }
  // No factor: a negative element.
  SmMatrix* indefinite(Shape shape, std::int64_t n) {
    Nonzeros elements;
    for (std::int64_t i = 0; i < n; ++i) elements[{i, i}] = i == 1 ? -2.0 : 1.0;
    return filled_with(session(), shape, n, n, elements).matrix;
  }
};

TEST_P(InverseTraceRefusals, two_empty_matrices_or_one_of_kind_none_answer_100_before_the_state) {
  expect_nothing_to_report([&](SmMatrix* a, SmMatrix* b) { return refused(a, b, -1); });
}

TEST_P(InverseTraceRefusals, one_open_matrix_of_two_answers_113_before_the_sizes_are_compared) {
  expect_not_closed([&](SmMatrix* a, SmMatrix* b) { return refused(a, b); });
}

TEST_P(InverseTraceRefusals, orders_that_do_not_agree_answer_111_before_the_kind_is_looked_at) {
  for (const Shape sa : kShapes)
    for (const Shape sb : kShapes) {
      EXPECT_EQ(refused(some(sa, 4, 4), some(sb, 5, 5), -1), SM_NOT_SQUARE) << name_of(sa) << ", " << name_of(sb);
    }
  for (const Shape sa : kGeneralShapes) {
    EXPECT_EQ(refused(some(sa, 3, 5), some(kGeneralRows, 3, 3)), SM_NOT_SQUARE) << name_of(sa);
    EXPECT_EQ(refused(some(sa, 5, 3), some(kGeneralRows, 5, 5)), SM_NOT_SQUARE) << name_of(sa);
    EXPECT_EQ(refused(definite(kSymmetricRows, 5), some(sa, 3, 5)), SM_NOT_SQUARE) << "rows count, not columns";
  }
  EXPECT_EQ(refused(new_sized(session(), kSymmetricRows, 0, 0), some(kGeneralRows, 4, 4)), SM_NOT_SQUARE)
      << "one empty matrix is looked at like any other";
  EXPECT_EQ(refused(definite(kSymmetricRows, 4), new_sized(session(), kGeneralSparse, 3, 4)), SM_NOT_SQUARE);
}

TEST_P(InverseTraceRefusals, a_general_or_inverted_matrix_answers_124) {
  for (const Shape sb : kShapes) {
    for (const Shape sa : kGeneralShapes) {
      EXPECT_EQ(refused(some(sa, 4, 4), some(sb, 4, 4), -1), SM_UNAVAILABLE) << name_of(sa) << ", " << name_of(sb);
    }
    for (const Shape sa : kSquareFactored)
      for (const std::int16_t in_place : {std::int16_t{0}, std::int16_t{1}}) {
        SmMatrix* a = definite(sa, 4);
        ASSERT_EQ(fn().qxsminv(a, in_place, kNan), SM_OK);
        EXPECT_EQ(refused(a, some(sb, 4, 4), 9), SM_UNAVAILABLE) << name_of(sa) << ", " << name_of(sb);
      }
  }
  EXPECT_EQ(refused(new_sized(session(), kGeneralSparse, 4, 4), some(kSymmetricRows, 4, 4)), SM_UNAVAILABLE);
}

TEST_P(InverseTraceRefusals, a_matrix_that_cannot_be_factored_answers_103_before_a_row_is_read) {
  for (const Shape sa : kInvertible) {
    SmMatrix* a = indefinite(sa, 3);
    EXPECT_EQ(refused(a, some(kGeneralRows, 3, 3), -1), SM_NOT_DEFINITE) << name_of(sa);
    EXPECT_EQ(refused(a, some(kGeneralRows, 3, 3), 3), SM_NOT_DEFINITE) << name_of(sa) << ", behind the last row";
    EXPECT_NE(a->state, SM_STATE_FACTORED);
  }
}

TEST_P(InverseTraceRefusals, a_negative_start_answers_117_with_a_sum_of_0) {
  for (const Shape sa : kInvertible)
    for (const Shape sb : kShapes) {
      for (const std::int64_t start : {std::int64_t{-1}, -kHuge - 1}) {
        EXPECT_EQ(ended(definite(sa, 4), some(sb, 4, 4), start, 0.0), SM_OUTSIDE) << name_of(sa) << ", " << name_of(sb);
      }
    }
}

TEST_P(InverseTraceRefusals, a_reordered_sparse_second_matrix_answers_118_with_a_sum_of_0) {
  for (const Shape sa : kInvertible)
    for (std::int32_t state = SM_STATE_REORDERED; state <= SM_STATE_FACTORED; ++state) {
      SmMatrix* b = definite(kSymmetricSparse, 4);
      ASSERT_EQ(bring_to(b, state), SM_OK);
      EXPECT_EQ(ended(definite(sa, 4), b, 0, 0.0), SM_REORDERED) << name_of(sa);
      EXPECT_EQ(ended(definite(sa, 4), b, -1, 0.0), SM_OUTSIDE) << "its row is looked at first";
      EXPECT_EQ(ended(definite(sa, 4), b, 4, 0.0), SM_OK) << "no row is read";
    }
}

TEST_P(InverseTraceRefusals, a_sparse_matrix_that_is_both_is_reordered_by_factoring_it) {
  SmMatrix* a = definite(kSymmetricSparse, 5);
  EXPECT_EQ(ended(a, a, 0, 0.0), SM_REORDERED);
  EXPECT_EQ(a->state, SM_STATE_FACTORED);
  EXPECT_EQ(ended(a, a, 0, 0.0), SM_REORDERED);
}

INSTANTIATE_BOTH_HOSTS(InverseTraceRefusals);

}  // namespace
}  // namespace sm::test
