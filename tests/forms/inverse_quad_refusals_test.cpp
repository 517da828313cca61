// qxsminvquad: its checks, their order, and what has happened to the result by then.
#include "forms/forms_support.hpp"

namespace sm::test {
namespace {

class InverseQuadRefusalsTest : public FormsTest {
 protected:
  SmStatus form_of(SmMatrix* a, SmMatrix* x, SmMatrix* r) { return fn().qxsminvquad(a, x, r); }
};
INSTANTIATE_BOTH_HOSTS(InverseQuadRefusalsTest);

TEST_P(InverseQuadRefusalsTest, an_empty_operand_answers_0_before_everything) {
  std::vector<SmMatrix*> empty{sized(kGeneralSparse, 3, 5), new_untyped(session())};
  for (const Shape shape : kShapes) {
    empty.push_back(typed(shape));
    empty.push_back(sized(shape, 0, 0));
  }
  SmMatrix* none = new_untyped_with_an_entry(session(), SM_STATE_OPEN);
  for (SmMatrix* m : empty)
    for (SmMatrix* other : {none, sized(kSymmetricSparse, 4), of({kGeneralRows}, 3, 5), of({kSymmetricRows}, 4, 4)}) {
      SmMatrix* r = result();
      EXPECT_EQ(form_of(m, other, r), SM_OK);
      EXPECT_EQ(form_of(other, m, r), SM_OK);
      EXPECT_EQ(form_of(m, other, other), SM_OK);
      EXPECT_EQ(form_of(other, m, other), SM_OK);
      EXPECT_EQ(form_of(m, m, m), SM_OK);
      EXPECT_TRUE(as_before(r));
    }
}

TEST_P(InverseQuadRefusalsTest, kind_none_then_open_operands) {
  SmMatrix* none = new_untyped_with_an_entry(session(), SM_STATE_OPEN);
  SmMatrix* open = sized(kSymmetricSparse, 7);
  SmMatrix* general = of({kGeneralRows}, 3, 5);
  EXPECT_EQ(form_of(none, open, none), SM_UNTYPED);
  none->state = SM_STATE_FACTORED;
  EXPECT_EQ(form_of(none, open, general), SM_UNTYPED);
  Random random(2);
  SmMatrix* without_array =
      build_in_place(session(), {kSymmetricRows, SM_STATE_FACTORED}, random_known(random, kSymmetricRows, 4, 4));
  EXPECT_EQ(form_of(open, general, open), SM_NOT_CLOSED);
  EXPECT_EQ(form_of(general, open, open), SM_NOT_CLOSED);
  EXPECT_EQ(form_of(without_array, open, general), SM_NOT_CLOSED);
  std::vector<double> data(16, 1.0);
  EXPECT_EQ(form_of(new_open_tied(session(), data, 4, 4, SM_KIND_DIAGONAL, SM_FORMAT_ROWS), general, general),
            SM_NOT_CLOSED);
  EXPECT_EQ(open->state, SM_STATE_OPEN);
  EXPECT_EQ(open->rows, 7);
}

TEST_P(InverseQuadRefusalsTest, a_missing_separate_array_comes_before_the_result_and_the_shapes) {
  Random random(3);
  SmMatrix* wide = of({kGeneralRows}, 3, 5);
  SmMatrix* fitting = of({kGeneralRows}, 3, 4);
  for (const Shape shape : kSquareFactored)
    for (const std::int32_t state : {SM_STATE_FACTORED, SM_STATE_INVERTED}) {
      SmMatrix* a = build_in_place(session(), {shape, state}, random_known(random, shape, 4, 4));
      SmMatrix* r = result();
      EXPECT_EQ(form_of(a, wide, a), SM_NO_FACTOR) << name_of(shape);
      EXPECT_EQ(form_of(a, wide, wide), SM_NO_FACTOR) << name_of(shape);
      EXPECT_EQ(form_of(a, wide, r), SM_NO_FACTOR) << name_of(shape);
      EXPECT_EQ(form_of(a, fitting, r), SM_NO_FACTOR) << name_of(shape);
      EXPECT_TRUE(as_before(r));
    }
  SmMatrix* sparse = of({kSymmetricSparse, SM_STATE_FACTORED}, 4, 4);
  sparse->row_start = nullptr;  // no call leaves that; the rows go with their pool
  EXPECT_EQ(form_of(sparse, wide, sparse), SM_NO_FACTOR);
  EXPECT_EQ(form_of(sparse, sized(kSymmetricSparse, 7), wide), SM_NOT_CLOSED) << "an open operand comes before it";
  SmMatrix* general = of({kGeneralRows}, 4, 4);
  general->state = SM_STATE_FACTORED;  // no call brings a general matrix there
  EXPECT_EQ(form_of(general, wide, wide), SM_NO_FACTOR);
  general->state = SM_STATE_CLOSED;
}

TEST_P(InverseQuadRefusalsTest, a_result_that_is_an_operand_comes_before_the_shapes) {
  for (const Operand& operand : all_operands()) {
    SmMatrix* m = of(operand, 4, 4);
    const Known before = read(m);
    SmMatrix* wide = of({kGeneralRows}, 3, 5);
    EXPECT_EQ(form_of(m, wide, m), SM_BAD_ARGUMENT) << name_of(operand);
    EXPECT_EQ(form_of(wide, m, m), SM_BAD_ARGUMENT) << name_of(operand);
    EXPECT_EQ(form_of(m, m, m), SM_BAD_ARGUMENT) << name_of(operand);
    EXPECT_TRUE(same_entries(read(m), before));
    EXPECT_EQ(m->state, operand.state);
  }
}

TEST_P(InverseQuadRefusalsTest, a_middle_matrix_that_is_not_square_then_columns_that_do_not_fit_then_the_result) {
  SmMatrix* general = of({kGeneralSparse}, 2, 2);
  SmMatrix* r = result();
  for (const Shape shape : kGeneralShapes)
    for (const std::int64_t cols : {3, 5}) {
      SmMatrix* a = of({shape}, 4, cols);
      EXPECT_EQ(form_of(a, of({kSymmetricRows}, 3, 3), general), SM_NOT_SQUARE);
      EXPECT_EQ(form_of(a, of({kGeneralRows}, 3, 4), r), SM_NOT_SQUARE);
    }
  for (const Operand& operand : all_operands())
    for (const std::int64_t cols : {3, 5}) {
      SmMatrix* a = of(operand, 4, 4);
      EXPECT_EQ(form_of(a, of({kSymmetricRows}, cols, cols), general), SM_DIMENSION_MISMATCH);
      EXPECT_EQ(form_of(a, of({kGeneralSparse}, 3, cols), r), SM_DIMENSION_MISMATCH);
      EXPECT_EQ(a->state, operand.state);
    }
  EXPECT_EQ(general->rows, 2);
  EXPECT_TRUE(as_before(r));
}

TEST_P(InverseQuadRefusalsTest, a_result_that_is_not_symmetric_comes_before_the_pair_and_before_it_is_sized) {
  for (const Shape shape : {kGeneralSparse, kGeneralColumns, kGeneralRows, kDiagonalColumns, kDiagonalRows}) {
    SmMatrix* r = of({shape}, 2, 2);
    const Known before = read(r);
    EXPECT_EQ(form_of(of({kSymmetricRows}, 4, 4), of({kGeneralRows}, 3, 4), r), SM_KIND_MISMATCH);
    EXPECT_EQ(form_of(of({kGeneralRows}, 4, 4), of({kSymmetricRows}, 4, 4), r), SM_KIND_MISMATCH);
    EXPECT_TRUE(same_entries(read(r), before)) << name_of(shape);
  }
  EXPECT_EQ(form_of(of({kSymmetricRows}, 4, 4), of({kGeneralRows}, 3, 4), new_untyped(session())), SM_KIND_MISMATCH);
}

TEST_P(InverseQuadRefusalsTest, sizing_that_fails_is_the_answer_before_the_pair) {
  for (const Shape shape : kSymmetricShapes)
    for (const Operand& operand : {Operand{kGeneralRows}, Operand{kSymmetricSparse}, Operand{kDiagonalRows}}) {
      SmMatrix* a = of(operand, 4, 4);
      SmMatrix* x = of({kGeneralRows}, 3, 4);
      SmMatrix* r = typed(shape);
      host().fail_request(0, false);
      EXPECT_EQ(form_of(a, x, r), SM_NO_MEMORY) << name_of(shape);
      EXPECT_EQ(host().stop_failing(), 1);
      EXPECT_EQ(a->state, SM_STATE_CLOSED);
    }
}

TEST_P(InverseQuadRefusalsTest, a_result_of_too_many_rows_answers_105) {
  SmMatrix* a = of({kSymmetricRows}, 2, 2);
  for (const Shape shape : kSymmetricShapes) {
    SmMatrix* x = of({kGeneralRows}, 3, 2);
    SmMatrix* r = typed(shape);
    x->rows = SM_MAX_ELEMENTS + 1;  // a shape that no array has
    EXPECT_EQ(form_of(a, x, r), SM_TOO_LARGE) << name_of(shape);
    EXPECT_EQ(a->state, SM_STATE_CLOSED);
    x->rows = 3;
  }
}

TEST_P(InverseQuadRefusalsTest, pairs_that_are_not_served_answer_124_with_the_result_sized) {
  std::vector<std::pair<Operand, Operand>> pairs;
  for (const Operand& outer : all_operands())
    for (const Operand& middle : kGeneralOperands) pairs.emplace_back(middle, outer);
  for (const Operand& outer : symmetric_and_diagonal())
    for (const Operand& middle : symmetric_and_diagonal()) pairs.emplace_back(middle, outer);
  for (const auto& [middle, outer] : pairs) {
    SCOPED_TRACE(name_of(middle) + " between " + name_of(outer));
    SmMatrix* a = of(middle, 4, 4);
    SmMatrix* x = of(outer, 4, 4);
    for (const Shape shape : kSymmetricShapes) {
      SmMatrix* r = result(shape);
      EXPECT_EQ(form_of(a, x, r), SM_UNAVAILABLE);
      EXPECT_EQ(r->rows, 4);
      EXPECT_TRUE(same(read(r), Known(4, 4)));
      destroy(r);
    }
    EXPECT_EQ(a->state, middle.state);
    destroy(a);
    destroy(x);
  }
}

TEST_P(InverseQuadRefusalsTest, a_factorization_that_fails_is_the_answer_and_work_goes_back) {
  Known indefinite(2, 2);
  indefinite.set(0, 0, 4.0);
  indefinite.set(1, 1, -3.0);
  for (const Shape middle : {kSymmetricSparse, kSymmetricColumns, kSymmetricRows, kDiagonalColumns, kDiagonalRows})
    for (const Shape outer : kGeneralShapes)
      for (const Shape shape : kSymmetricShapes) {
        SmMatrix* a = build(middle, indefinite);
        SmMatrix* x = of({outer}, 3, 2);
        SmMatrix* r = result(shape);
        const std::int64_t loose = host().live_blocks() - blocks_of(a) - blocks_of(r);
        EXPECT_EQ(form_of(a, x, r), SM_NOT_DEFINITE) << name_of(middle) << ' ' << name_of(outer);
        EXPECT_EQ(r->rows, 3);
        EXPECT_TRUE(same(read(r), Known(3, 3)));
        EXPECT_EQ(host().live_blocks() - blocks_of(a) - blocks_of(r), loose);
      }
}

TEST_P(InverseQuadRefusalsTest, an_inverse_in_format_22_cannot_be_solved_with) {
  for (const Shape outer : kGeneralShapes) {
    SmMatrix* a = of({kSymmetricColumns, SM_STATE_INVERTED}, 4, 4);
    SmMatrix* x = of({outer}, 3, 4);
    SmMatrix* r = result();
    const std::int64_t loose = host().live_blocks() - blocks_of(r);
    EXPECT_EQ(form_of(a, x, r), SM_WRONG_STATE) << name_of(outer);
    EXPECT_EQ(host().live_blocks() - blocks_of(r), loose);
  }
}

}  // namespace
}  // namespace sm::test
