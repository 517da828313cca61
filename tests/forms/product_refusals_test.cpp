// qxsmmultm: its checks, their order, and what has happened to the result by then.
#include "forms/product_support.hpp"

namespace sm::test {
namespace {

class ProductRefusalsTest : public FormsTest {
 protected:
  SmMatrix* result(Shape shape = kGeneralRows) { return build(shape, kBefore); }
};
INSTANTIATE_BOTH_HOSTS(ProductRefusalsTest);

TEST_P(ProductRefusalsTest, two_empty_operands_answer_0_before_everything) {
  std::vector<SmMatrix*> empty{sized(kGeneralSparse, 3, 5), new_untyped(session())};
  for (const Shape shape : kShapes) {
    empty.push_back(typed(shape));
    empty.push_back(sized(shape, 0, 0));
  }
  for (SmMatrix* a : empty)
    for (SmMatrix* b : empty)
      for (const std::int32_t keep : {0, 1}) {
        SmMatrix* c = result();
        EXPECT_EQ(qxsmmultm(a, b, c, keep), SM_OK);
        EXPECT_TRUE(as_before(c));
        EXPECT_EQ(qxsmmultm(a, b, a, keep), SM_OK);
        EXPECT_EQ(qxsmmultm(a, b, b, keep), SM_OK);
        destroy(c);
      }
}

TEST_P(ProductRefusalsTest, kind_none_of_the_first_then_open_operands) {
  SmMatrix* none = new_untyped(session());
  SmMatrix* open = sized(kSymmetricSparse, 7);
  SmMatrix* c = result();
  EXPECT_EQ(qxsmmultm(none, open, none, 0), SM_UNTYPED);
  EXPECT_EQ(qxsmmultm(none, of({kGeneralRows}, 3, 5), c, 0), SM_UNTYPED);
  // Open operands come before a result that is one, and before the shapes.
  EXPECT_EQ(qxsmmultm(open, of({kGeneralRows}, 3, 5), open, 0), SM_NOT_CLOSED);
  EXPECT_EQ(qxsmmultm(open, none, open, 0), SM_NOT_CLOSED);
  EXPECT_EQ(qxsmmultm(of({kGeneralRows}, 3, 5), open, open, 0), SM_NOT_CLOSED);
  EXPECT_EQ(qxsmmultm(of({kGeneralRows}, 3, 5), none, c, 0), SM_NOT_CLOSED);
  EXPECT_EQ(qxsmmultm(typed(kGeneralRows), of({kGeneralRows}, 3, 5), c, 0), SM_NOT_CLOSED);
  std::vector<double> data(16, 1.0);
  SmMatrix* tied = new_open_tied(session(), data, 4, 4, SM_KIND_GENERAL, SM_FORMAT_ROWS);
  EXPECT_EQ(qxsmmultm(tied, of({kGeneralRows}, 3, 5), tied, 0), SM_NOT_CLOSED);
  EXPECT_TRUE(as_before(c));
  EXPECT_EQ(open->rows, 7);
}

TEST_P(ProductRefusalsTest, a_result_that_is_an_operand_comes_before_the_shapes) {
  for (const Operand& operand : all_operands())
    for (const std::int32_t keep : {0, 1}) {
      SmMatrix* m = of(operand, 4, 4);
      SmMatrix* other = of({kGeneralRows}, 3, 5);
      const Known before = read(m);
      EXPECT_EQ(qxsmmultm(m, other, m, keep), SM_BAD_ARGUMENT) << name_of(operand);
      EXPECT_EQ(qxsmmultm(other, m, m, keep), SM_BAD_ARGUMENT) << name_of(operand);
      EXPECT_EQ(qxsmmultm(m, m, m, keep), SM_BAD_ARGUMENT) << name_of(operand);
      EXPECT_EQ(qxsmmultm(m, sized(kGeneralSparse, 4, 4), m, keep), SM_BAD_ARGUMENT) << name_of(operand);
      EXPECT_TRUE(same_entries(read(m), before));
      EXPECT_EQ(m->state, operand.state);
    }
}

TEST_P(ProductRefusalsTest, inner_dimensions_that_differ_answer_121_before_the_result_is_touched) {
  for (const Operand& left : all_operands())
    for (const Operand& right :
         {Operand{kGeneralSparse}, Operand{kGeneralRows}, Operand{kSymmetricRows}, Operand{kDiagonalRows}})
      for (const std::int64_t rows : {3, 5}) {
        SmMatrix* c = result();
        SmMatrix* b = of(right, rows, rows);
        EXPECT_EQ(qxsmmultm(of(left, 4, 4), b, c, 0), SM_DIMENSION_MISMATCH) << name_of(left);
        EXPECT_TRUE(as_before(c));
        EXPECT_EQ(qxsmmultm(sized(kGeneralSparse, 4, 4), b, c, 0), SM_DIMENSION_MISMATCH);
        EXPECT_TRUE(as_before(c));
      }
}

TEST_P(ProductRefusalsTest, a_diagonal_result_of_factors_that_are_not_answers_121_before_it_is_touched) {
  for (const Operand& left : all_operands())
    for (const Operand& right : all_operands()) {
      if (left.shape.kind == SM_KIND_DIAGONAL || right.shape.kind == SM_KIND_DIAGONAL) continue;
      SmMatrix* a = of(left, 4, 4);
      SmMatrix* b = of(right, 4, 4);
      for (const Shape shape : {kDiagonalColumns, kDiagonalRows})
        for (const std::int32_t keep : {0, 1}) {
          SmMatrix* c = of({shape, SM_STATE_FACTORED}, 2, 2);
          const Known before = read(c);
          EXPECT_EQ(qxsmmultm(a, b, c, keep), SM_DIMENSION_MISMATCH) << name_of(left) << " times " << name_of(right);
          EXPECT_TRUE(same_entries(read(c), before));
          EXPECT_EQ(c->state, SM_STATE_FACTORED);
          destroy(c);
        }
      destroy(a);
      destroy(b);
    }
}

TEST_P(ProductRefusalsTest, pairs_that_are_not_served_answer_124_with_the_result_sized) {
  for (const Operand& left : all_operands())
    for (const Operand& right : all_operands()) {
      if (multiplies(left.shape, right.shape)) continue;
      SCOPED_TRACE(name_of(left) + " times " + name_of(right));
      SmMatrix* a = of(left, 4, 4);
      SmMatrix* b = of(right, 4, 4);
      for (const Shape shape : kShapes) {
        if (shape.kind == SM_KIND_DIAGONAL) continue;
        SmMatrix* c = of({shape}, 2, 2);
        EXPECT_EQ(qxsmmultm(a, b, c, 0), SM_UNAVAILABLE);
        EXPECT_EQ(c->rows, 4);
        EXPECT_TRUE(same(read(c), Known(4, 4)));
        destroy(c);
        SmMatrix* kept = of({shape}, 2, 2);
        const Known before = read(kept);
        EXPECT_EQ(qxsmmultm(a, b, kept, 1), SM_UNAVAILABLE);
        EXPECT_TRUE(same_entries(read(kept), before));
        destroy(kept);
      }
      destroy(a);
      destroy(b);
    }
  SmMatrix* c = result();  // the pair before an empty operand
  EXPECT_EQ(qxsmmultm(sized(kGeneralSparse, 3, 4), of({kSymmetricRows}, 4, 4), c, 0), SM_UNAVAILABLE);
  EXPECT_EQ(c->rows, 3);
  EXPECT_EQ(qxsmmultm(of({kSymmetricColumns}, 4, 4), sized(kGeneralSparse, 4, 5), c, 0), SM_UNAVAILABLE);
  EXPECT_EQ(c->cols, 5);
}

TEST_P(ProductRefusalsTest, one_empty_operand_gives_a_result_of_zeros) {
  for (const Operand& operand : all_operands()) {
    SCOPED_TRACE(name_of(operand));
    SmMatrix* m = of(operand, 4, 4);
    for (const bool first : {true, false}) {
      SmMatrix* empty = first ? sized(kGeneralSparse, 3, 4) : sized(kGeneralSparse, 4, 5);
      if (!multiplies(first ? kGeneralSparse : operand.shape, first ? operand.shape : kGeneralSparse)) continue;
      SmMatrix* a = first ? empty : m;
      SmMatrix* b = first ? m : empty;
      for (const Shape shape : kGeneralShapes) {
        SmMatrix* c = result(shape);
        EXPECT_EQ(qxsmmultm(a, b, c, 0), SM_OK);
        EXPECT_TRUE(same(read(c), Known(a->rows, b->cols))) << name_of(shape);
        SmMatrix* kept = result(shape);
        EXPECT_EQ(qxsmmultm(a, b, kept, 1), SM_OK);
        EXPECT_TRUE(as_before(kept)) << name_of(shape);
      }
    }
  }
}

}  // namespace
}  // namespace sm::test
