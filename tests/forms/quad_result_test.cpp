// qxsmquad: what becomes of its result matrix.
#include "forms/forms_support.hpp"

namespace sm::test {
namespace {

class QuadResultTest : public FormsTest {
 protected:
  SmMatrix* middle(Shape shape = kSymmetricRows) { return build(shape, kA); }
  static inline const Known kA = Known::full({{2.0, 1.0}, {1.0, 3.0}});
  static inline const Known kX = Known::full({{1.0, 0.0}, {0.0, 1.0}, {1.0, 1.0}});
  static inline const Known kForm = Known::full({{2.0, 1.0, 3.0}, {1.0, 3.0, 4.0}, {3.0, 4.0, 7.0}});
};
INSTANTIATE_BOTH_HOSTS(QuadResultTest);

TEST_P(QuadResultTest, is_left_open_when_kept_so_that_more_can_be_entered) {
  for (const Shape shape : kGeneralShapes) {
    SmMatrix* r = sized(kSymmetricSparse, 3);
    ASSERT_EQ(fn().qxsmquad(middle(), build(shape, kX), r, 1), SM_OK);
    EXPECT_EQ(r->state, SM_STATE_OPEN);
    ASSERT_EQ(fn().qxsmassign(r, 0, 2, 1, 10.0), SM_OK);
    ASSERT_EQ(fn().qxsmquad(middle(), build(shape, kX), r, 1), SM_OK);
    ASSERT_EQ(fn().qxsmclose(r, kNan), SM_OK);
    EXPECT_TRUE(same(read(r), Known::full({{4.0, 2.0, 16.0}, {2.0, 6.0, 8.0}, {16.0, 8.0, 14.0}})));
  }
}

TEST_P(QuadResultTest, grows_when_it_is_open_and_too_small) {
  for (const Shape shape : kGeneralShapes) {
    SmMatrix* r = sized(kSymmetricSparse, 1);
    ASSERT_EQ(fn().qxsmquad(middle(), build(shape, kX), r, 1), SM_OK);
    EXPECT_EQ(r->rows, 3);
    ASSERT_EQ(fn().qxsmclose(r, kNan), SM_OK);
    EXPECT_TRUE(same(read(r), kForm));
  }
}

TEST_P(QuadResultTest, without_a_size_takes_nothing_when_it_is_kept) {
  for (const Shape outer : kGeneralShapes)
    for (const Shape shape : kSymmetricShapes) {
      SmMatrix* r = typed(shape);
      const bool whole = outer != kGeneralSparse && shape == kSymmetricColumns;
      EXPECT_EQ(fn().qxsmquad(middle(), build(outer, kX), r, 1), whole ? SM_DIMENSION_MISMATCH : SM_OK);
      EXPECT_EQ(r->nnz, 0);
    }
}

TEST_P(QuadResultTest, loses_an_earlier_factor_when_it_is_sized) {
  Random random(1);
  for (const Shape outer : kGeneralShapes)
    for (const Operand& operand : kSymmetricOperands) {
      SCOPED_TRACE(name_of(operand));
      for (const std::int64_t n : {3, 5}) {
        SmMatrix* r = build(operand, random_known(random, operand.shape, n, n));
        ASSERT_EQ(fn().qxsmquad(middle(), build(outer, kX), r, 0), SM_OK);
        EXPECT_EQ(r->state, SM_STATE_CLOSED);
        expect_voided(r);
        EXPECT_TRUE(same(read(r), kForm));
        if (!is_sparse(operand.shape)) {
          EXPECT_EQ(r->dense_factor, nullptr);
        }
        destroy(r);
      }
    }
}

TEST_P(QuadResultTest, in_format_22_written_as_a_whole_loses_factor_rank_and_log_determinant) {
  Random random(2);
  for (const Shape outer : {kGeneralColumns, kGeneralRows})
    for (const std::int32_t state : {SM_STATE_CLOSED, SM_STATE_FACTORED, SM_STATE_INVERTED})
      for (const bool in_place : {false, true}) {
        if (in_place && state == SM_STATE_CLOSED) continue;
        const Operand operand{kSymmetricColumns, state};
        const Known before = random_known(random, kSymmetricColumns, 3, 3);
        SmMatrix* r = in_place ? build_in_place(session(), operand, before) : build(operand, before);
        SmMatrix* a = middle();
        SmMatrix* x = build(outer, kX);
        const std::int64_t loose = host().live_blocks() - blocks_of(r);
        ASSERT_EQ(fn().qxsmquad(a, x, r, 1), SM_OK);
        EXPECT_EQ(r->state, SM_STATE_CLOSED);
        EXPECT_EQ(r->dense_factor, nullptr);
        expect_voided(r);
        EXPECT_TRUE(same(read(r), kForm));
        EXPECT_EQ(host().live_blocks() - blocks_of(r), loose) << "the separate array went back";
        double log_det = 0.0;
        EXPECT_EQ(fn().qxsmrank(r, &r->rank), SM_OK);  // factors what was written: kX has rank 2
        EXPECT_EQ(r->rank, 2);
        EXPECT_EQ(fn().qxsmlogdet(r, &log_det), SM_OK);
      }
}

TEST_P(QuadResultTest, in_format_22_and_kept_must_have_the_order_of_the_rows_for_dense_ones) {
  for (const Shape outer : {kGeneralColumns, kGeneralRows}) {
    SmMatrix* a = middle();
    SmMatrix* x = build(outer, kX);
    for (const std::int64_t n : {1, 2, 4}) {
      Random random(3);
      const Known before = random_known(random, kSymmetricColumns, n, n);
      SmMatrix* r = build({kSymmetricColumns, SM_STATE_FACTORED}, before);
      const std::int64_t blocks = host().live_blocks();
      EXPECT_EQ(fn().qxsmquad(a, x, r, 1), SM_DIMENSION_MISMATCH) << n;
      EXPECT_TRUE(same(read(r), before));
      EXPECT_EQ(host().live_blocks(), blocks);
    }
  }
}

TEST_P(QuadResultTest, an_assignment_that_fails_is_the_answer_and_work_goes_back) {
  for (const Shape outer : kGeneralShapes)
    for (const Shape inner : kSymmetricShapes) {
      SCOPED_TRACE(name_of(inner) + " between " + name_of(outer));
      SmMatrix* a = middle(inner);
      SmMatrix* x = build(outer, kX);
      SmMatrix* closed = build(kSymmetricSparse, kForm);
      SmMatrix* small_packed = build(kSymmetricRows, kA);  // of order 2: element (0, 2) is outside
      const std::int64_t blocks = host().live_blocks();
      EXPECT_EQ(fn().qxsmquad(a, x, closed, 1), SM_ALREADY_CLOSED);
      EXPECT_TRUE(same(read(closed), kForm));
      EXPECT_EQ(fn().qxsmquad(a, x, small_packed, 1), SM_BAD_ARGUMENT);
      EXPECT_EQ(host().live_blocks(), blocks);
      EXPECT_EQ(host().violations(), 0);
    }
}

TEST_P(QuadResultTest, a_packed_result_that_is_entered_element_by_element_loses_its_factor_too) {
  Random random(4);
  for (const Shape outer : kGeneralShapes)
    for (const Shape shape : kPacked) {
      if (outer != kGeneralSparse && shape == kSymmetricColumns) continue;
      const Known before = random_known(random, shape, 3, 3);
      SmMatrix* r = build({shape, SM_STATE_FACTORED}, before);
      ASSERT_EQ(fn().qxsmquad(middle(), build(outer, kX), r, 1), SM_OK);
      EXPECT_EQ(r->state, SM_STATE_CLOSED);
      EXPECT_EQ(r->dense_factor, nullptr);
      expect_voided(r);
      EXPECT_TRUE(same(read(r), sum(before, kForm)));
    }
}

// Requests of the sizing come first; the call goes on without what it refused.
TEST_P(QuadResultTest, whose_sizing_fails_is_no_error_when_nothing_has_to_be_entered) {
  const double tiny = 1e-160;
  for (const Shape outer : kGeneralShapes) {
    SmMatrix* a = build(kSymmetricSparse, Known::full({{tiny, 0.0}, {0.0, tiny}}));
    SmMatrix* x = build(outer, kX);
    for (const Shape shape : {kSymmetricSparse, kSymmetricRows}) {
      SmMatrix* r = typed(shape);
      host().fail_request(0, false);
      EXPECT_EQ(fn().qxsmquad(a, x, r, 0), SM_OK) << name_of(outer) << " into " << name_of(shape);
      EXPECT_EQ(host().stop_failing(), 1);
      EXPECT_EQ(r->nnz, 0);
    }
  }
}

TEST_P(QuadResultTest, whose_sizing_fails_answers_101_when_something_has_to_be_entered) {
  for (const Shape outer : kGeneralShapes)
    for (const Shape shape : kSymmetricShapes) {
      SmMatrix* a = middle();
      SmMatrix* x = build(outer, kX);
      SmMatrix* r = typed(shape);
      host().fail_request(0, false);
      EXPECT_EQ(fn().qxsmquad(a, x, r, 0), SM_NO_MEMORY) << name_of(outer) << " into " << name_of(shape);
      EXPECT_EQ(host().stop_failing(), 1);
      EXPECT_EQ(fn().qxsmquad(a, x, r, 0), SM_OK);
      EXPECT_TRUE(same(read(r), kForm));
    }
}

}  // namespace
}  // namespace sm::test
