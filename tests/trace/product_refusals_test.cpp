// What the trace of a product answers when it cannot be had, and in which order: qxsmtraceAB.
#include <gtest/gtest.h>

#include "cholesky/cholesky_support.hpp"
#include "trace/trace_refusals.hpp"

namespace sm::test {
namespace {

class ProductTraceRefusals : public TraceRefusals {
 protected:
  // The status of a call that must leave the missing value.
  SmStatus refused(SmMatrix* a, SmMatrix* b) {
    Output out(1);
    const SmStatus status = fn().qxsmtraceAB(a, b, out.data());
    EXPECT_TRUE(is_missing(out.values()[0])) << "status " << status;
    return status;
  }
};

constexpr Shape kNotGeneral[] = {kSymmetricSparse, kSymmetricColumns, kSymmetricRows, kDiagonalColumns, kDiagonalRows};

TEST_P(ProductTraceRefusals, two_empty_matrices_or_one_of_kind_none_answer_100_before_state_and_size) {
  expect_nothing_to_report([&](SmMatrix* a, SmMatrix* b) { return refused(a, b); });
}

TEST_P(ProductTraceRefusals, one_open_matrix_of_two_answers_113_before_the_sizes_are_compared) {
  expect_not_closed([&](SmMatrix* a, SmMatrix* b) { return refused(a, b); });
}

TEST_P(ProductTraceRefusals, columns_that_are_not_the_others_rows_answer_121_before_the_pair_is_looked_at) {
  for (const Shape sa : kShapes)
    for (const Shape sb : kShapes) {
      EXPECT_EQ(refused(some(sa, 4, 4), some(sb, 5, 5)), SM_DIMENSION_MISMATCH) << name_of(sa) << ", " << name_of(sb);
    }
  for (const Shape sa : kGeneralShapes)
    for (const Shape sb : kGeneralShapes) {
      EXPECT_EQ(refused(some(sa, 3, 5), some(sb, 3, 5)), SM_DIMENSION_MISMATCH) << name_of(sa) << ", " << name_of(sb);
    }
  SmMatrix* odd = some(kGeneralRows, 3, 3);
  odd->kind = 9;
  EXPECT_EQ(refused(odd, some(kGeneralRows, 4, 4)), SM_DIMENSION_MISMATCH);
  EXPECT_EQ(refused(odd, some(kGeneralRows, 3, 3)), SM_UNAVAILABLE);
  EXPECT_EQ(refused(new_sized(session(), kGeneralSparse, 3, 3), some(kGeneralRows, 4, 4)), SM_DIMENSION_MISMATCH)
      << "one empty matrix is looked at like any other";
  EXPECT_EQ(refused(new_sized(session(), kSymmetricRows, 0, 0), some(kGeneralRows, 4, 4)), SM_DIMENSION_MISMATCH);
}

TEST_P(ProductTraceRefusals, a_general_matrix_serves_a_general_one_only) {
  for (const Shape sa : kGeneralShapes) {
    for (const Shape sb : kNotGeneral) {
      EXPECT_EQ(refused(some(sa, 4, 4), some(sb, 4, 4)), SM_UNAVAILABLE) << name_of(sa) << ", " << name_of(sb);
      EXPECT_EQ(refused(some(sa, 2, 4), some(sb, 4, 4)), SM_UNAVAILABLE) << name_of(sa) << ", " << name_of(sb);
    }
  }
}

TEST_P(ProductTraceRefusals, a_symmetric_matrix_by_columns_serves_no_general_one) {
  for (const Shape sb : kGeneralShapes) {
    EXPECT_EQ(refused(some(kSymmetricColumns, 4, 4), some(sb, 4, 4)), SM_UNAVAILABLE) << name_of(sb);
    EXPECT_EQ(refused(some(kSymmetricColumns, 4, 4), some(sb, 4, 2)), SM_UNAVAILABLE) << name_of(sb);
  }
}

// Formats that no call makes: the first matrix is looked at before the second, and what is not computed is told by 0
// and the missing value.
TEST_P(ProductTraceRefusals, a_format_that_does_not_exist_is_answered_by_the_first_matrix_then_by_the_second) {
  SmMatrix* odd_general = some(kGeneralRows, 4, 4);
  odd_general->format = 24;
  for (const Shape sb : kShapes) EXPECT_EQ(refused(odd_general, some(sb, 4, 4)), SM_OK) << name_of(sb);
  SmMatrix* odd_symmetric = some(kSymmetricRows, 4, 4);
  odd_symmetric->format = 24;
  for (const Shape sb : kShapes) EXPECT_EQ(refused(odd_symmetric, some(sb, 4, 4)), SM_OK) << name_of(sb);
  EXPECT_EQ(refused(some(kSymmetricSparse, 4, 4), odd_general), SM_OK);
  EXPECT_EQ(refused(some(kSymmetricRows, 4, 4), odd_general), SM_UNAVAILABLE);
  EXPECT_EQ(refused(some(kSymmetricColumns, 4, 4), odd_general), SM_UNAVAILABLE);
  for (const Shape sa : kGeneralShapes) EXPECT_EQ(refused(some(sa, 4, 4), odd_general), SM_UNAVAILABLE) << name_of(sa);
  odd_general->format = SM_FORMAT_ROWS;
  odd_symmetric->format = SM_FORMAT_ROWS;
}

TEST_P(ProductTraceRefusals, a_second_kind_that_does_not_exist_is_answered_by_the_first_matrix) {
  SmMatrix* odd = some(kGeneralRows, 4, 4);
  odd->kind = 9;
  EXPECT_EQ(refused(some(kSymmetricSparse, 4, 4), odd), SM_UNAVAILABLE);
  EXPECT_EQ(refused(some(kSymmetricRows, 4, 4), odd), SM_OK) << "nothing is computed";
  EXPECT_EQ(refused(some(kSymmetricColumns, 4, 4), odd), SM_UNAVAILABLE);
  EXPECT_EQ(refused(some(kGeneralColumns, 4, 4), odd), SM_UNAVAILABLE);
  EXPECT_EQ(refused(some(kDiagonalRows, 4, 4), odd), SM_UNAVAILABLE) << "the answer of reading its diagonal";
}

TEST_P(ProductTraceRefusals, two_sparse_matrices_with_a_reordered_second_answer_0_and_the_missing_value) {
  Random random(2);
  for (std::int32_t state = SM_STATE_REORDERED; state <= SM_STATE_FACTORED; ++state) {
    const Filled a = filled_definite(session(), kSymmetricSparse, 5, random);
    const Filled b = filled_definite(session(), kSymmetricSparse, 5, random);
    ASSERT_EQ(bring_to(b.matrix, state), SM_OK);
    EXPECT_EQ(refused(a.matrix, b.matrix), SM_OK) << state;
  }
}

INSTANTIATE_BOTH_HOSTS(ProductTraceRefusals);

}  // namespace
}  // namespace sm::test
