// qxsmquad: its checks, their order, and what has happened to the result by then.
#include "forms/forms_support.hpp"

namespace sm::test {
namespace {

class QuadRefusalsTest : public FormsTest {};
INSTANTIATE_BOTH_HOSTS(QuadRefusalsTest);

TEST_P(QuadRefusalsTest, an_empty_middle_matrix_answers_0_before_everything) {
  for (const Shape shape : kShapes)
    for (SmMatrix* a : {typed(shape), sized(shape, 0, 0)})
      for (const std::int32_t keep : {0, 1}) {
        SmMatrix* r = result();
        EXPECT_EQ(fn().qxsmquad(a, sized(kSymmetricSparse, 7), r, keep), SM_OK) << name_of(shape);
        EXPECT_EQ(fn().qxsmquad(a, new_untyped(session()), r, keep), SM_OK);
        EXPECT_EQ(fn().qxsmquad(a, a, a, keep), SM_OK);
        EXPECT_TRUE(as_before(r));
      }
  SmMatrix* r = result();
  EXPECT_EQ(fn().qxsmquad(sized(kGeneralSparse, 4, 4), of({kGeneralRows}, 3, 4), r, 0), SM_OK);
  EXPECT_TRUE(as_before(r));
}

TEST_P(QuadRefusalsTest, kind_none_then_open_operands) {
  SmMatrix* none = new_untyped_with_an_entry(session(), SM_STATE_OPEN);
  SmMatrix* open = sized(kSymmetricSparse, 7);
  SmMatrix* general = of({kGeneralRows}, 2, 2);
  EXPECT_EQ(fn().qxsmquad(none, open, none, 0), SM_UNTYPED);
  EXPECT_EQ(fn().qxsmquad(none, open, general, 0), SM_UNTYPED);
  // An open operand comes before a result that is one, shapes, and the kind of the result.
  EXPECT_EQ(fn().qxsmquad(open, of({kGeneralRows}, 3, 4), open, 0), SM_NOT_CLOSED);
  EXPECT_EQ(fn().qxsmquad(of({kSymmetricRows}, 4, 4), open, open, 0), SM_NOT_CLOSED);
  EXPECT_EQ(fn().qxsmquad(of({kSymmetricRows}, 4, 4), open, general, 0), SM_NOT_CLOSED);
  EXPECT_EQ(fn().qxsmquad(of({kSymmetricRows}, 4, 4), new_untyped(session()), general, 0), SM_NOT_CLOSED);
  EXPECT_EQ(general->rows, 2);
  EXPECT_EQ(open->rows, 7);
  EXPECT_EQ(open->state, SM_STATE_OPEN);
}

TEST_P(QuadRefusalsTest, a_result_that_is_an_operand_comes_before_the_shapes) {
  for (const Operand& operand : all_operands())
    for (const std::int32_t keep : {0, 1}) {
      SmMatrix* m = of(operand, 4, 4);
      SmMatrix* other = of({kGeneralRows}, 3, 5);
      const Known before = read(m);
      EXPECT_EQ(fn().qxsmquad(m, other, m, keep), SM_BAD_ARGUMENT) << name_of(operand);
      EXPECT_EQ(fn().qxsmquad(m, m, m, keep), SM_BAD_ARGUMENT) << name_of(operand);
      EXPECT_EQ(fn().qxsmquad(of({kSymmetricRows}, 3, 3), m, m, keep), SM_BAD_ARGUMENT) << name_of(operand);
      EXPECT_TRUE(same_entries(read(m), before));
      EXPECT_EQ(m->state, operand.state);
    }
}

TEST_P(QuadRefusalsTest, columns_that_do_not_fit_come_before_the_kind_of_the_result) {
  for (const Operand& operand : all_operands())
    for (const Shape shape : kGeneralShapes)
      for (const std::int64_t cols : {3, 5}) {
        SmMatrix* general = of({kGeneralSparse}, 2, 2);
        SmMatrix* r = result();
        EXPECT_EQ(fn().qxsmquad(of(operand, 4, 4), of({shape}, 3, cols), general, 0), SM_DIMENSION_MISMATCH);
        EXPECT_EQ(fn().qxsmquad(of(operand, 4, 4), of({shape}, 3, cols), r, 0), SM_DIMENSION_MISMATCH);
        EXPECT_EQ(general->rows, 2);
        EXPECT_TRUE(as_before(r));
      }
}

TEST_P(QuadRefusalsTest, a_result_that_is_not_symmetric_comes_before_the_pair_and_before_it_is_sized) {
  for (const Shape shape : {kGeneralSparse, kGeneralColumns, kGeneralRows, kDiagonalColumns, kDiagonalRows}) {
    SmMatrix* r = of({shape}, 2, 2);
    const Known before = read(r);
    EXPECT_EQ(fn().qxsmquad(of({kSymmetricRows}, 4, 4), of({kGeneralRows}, 3, 4), r, 0), SM_KIND_MISMATCH);
    EXPECT_EQ(fn().qxsmquad(of({kGeneralRows}, 4, 4), of({kGeneralSparse}, 3, 4), r, 0), SM_KIND_MISMATCH);
    EXPECT_TRUE(same_entries(read(r), before)) << name_of(shape);
  }
  EXPECT_EQ(fn().qxsmquad(of({kSymmetricRows}, 4, 4), of({kGeneralRows}, 3, 4), new_untyped(session()), 0),
            SM_KIND_MISMATCH);
}

TEST_P(QuadRefusalsTest, by_rows_only_a_symmetric_middle_matrix_is_served_and_the_result_is_sized_by_then) {
  std::vector<Operand> middles(std::begin(kGeneralOperands), std::end(kGeneralOperands));
  middles.insert(middles.end(), std::begin(kDiagonalOperands), std::end(kDiagonalOperands));
  std::vector<Operand> outers = symmetric_and_diagonal();
  outers.push_back({kGeneralSparse});
  for (const Operand& middle : middles)
    for (const Operand& outer : outers) {
      SCOPED_TRACE(name_of(middle) + " between " + name_of(outer));
      SmMatrix* a = of(middle, 4, 4);
      SmMatrix* x = of(outer, 4, 4);
      SmMatrix* kept = result();
      EXPECT_EQ(fn().qxsmquad(a, x, kept, 1), SM_UNAVAILABLE);
      EXPECT_TRUE(as_before(kept));
      SmMatrix* r = result();
      EXPECT_EQ(fn().qxsmquad(a, x, r, 0), SM_UNAVAILABLE);
      EXPECT_EQ(r->rows, 4);
      EXPECT_TRUE(same(read(r), Known(4, 4)));
      for (SmMatrix* m : {a, x, kept, r}) destroy(m);
    }
}

TEST_P(QuadRefusalsTest, a_reordered_x_answers_118_with_the_result_sized) {
  for (const Operand& middle : kSymmetricOperands)
    for (std::int32_t state = SM_STATE_REORDERED; state <= SM_STATE_FACTORED; ++state) {
      SmMatrix* a = of(middle, 4, 4);
      SmMatrix* x = of({kSymmetricSparse, state}, 4, 4);
      const std::int64_t blocks = host().live_blocks();
      SmMatrix* kept = result();
      EXPECT_EQ(fn().qxsmquad(a, x, kept, 1), SM_REORDERED) << name_of(middle) << ' ' << state;
      EXPECT_TRUE(as_before(kept));
      destroy(kept);
      SmMatrix* r = result();
      EXPECT_EQ(fn().qxsmquad(a, x, r, 0), SM_REORDERED) << name_of(middle) << ' ' << state;
      EXPECT_EQ(r->rows, 4);
      EXPECT_TRUE(same(read(r), Known(4, 4)));
      destroy(r);
      EXPECT_EQ(host().live_blocks(), blocks);
    }
}

TEST_P(QuadRefusalsTest, a_middle_matrix_that_is_not_square_is_refused_after_the_result_was_sized) {
  for (const Shape middle : kGeneralShapes)
    for (const Shape outer : {kGeneralColumns, kGeneralRows}) {
      SmMatrix* r = result();
      EXPECT_EQ(fn().qxsmquad(of({middle}, 4, 5), of({outer}, 3, 4), r, 0), SM_NOT_SQUARE) << name_of(middle);
      EXPECT_EQ(r->rows, 3);
      EXPECT_TRUE(same(read(r), Known(3, 3)));
    }
}

// A shape that no array has is claimed after the fact: it must be refused before anything is read.
TEST_P(QuadRefusalsTest, work_of_more_than_2_to_the_53_elements_answers_105) {
  SmMatrix* a = of({kSymmetricRows}, 2, 2);
  for (const Shape shape : {kGeneralColumns, kGeneralRows})
    for (const std::int64_t rows : {SM_MAX_ELEMENTS, std::int64_t{1} << 40, std::int64_t{1} << 27}) {
      // 2^27 rows: the form has 2^53 + 2^26 elements; the copy of X is small enough to be asked for, and need not be
      // had.
      const bool may_lack_memory = shape == kGeneralColumns && rows < SM_MAX_ELEMENTS;
      SmMatrix* x = of({shape}, 3, 2);
      SmMatrix* r = result();
      x->rows = rows;
      const std::int64_t blocks = host().live_blocks();
      if (may_lack_memory) host().fail_request(0, true);
      EXPECT_EQ(fn().qxsmquad(a, x, r, 1), may_lack_memory ? SM_NO_MEMORY : SM_TOO_LARGE) << name_of(shape) << rows;
      if (may_lack_memory) host().stop_failing();
      x->rows = 3;
      EXPECT_TRUE(as_before(r));
      EXPECT_EQ(host().live_blocks(), blocks);
    }
}

}  // namespace
}  // namespace sm::test
