// qxsminvquadv and qxsminvbilin: their checks, the order of these, and what is cleared by then.
#include "forms/forms_support.hpp"

namespace sm::test {
namespace {

constexpr std::int64_t kTooMany = SM_MAX_ELEMENTS;  // vectors of more than one element

class InverseVectorRefusalsTest : public FormsTest {
 protected:
  SmMatrix* in_place(Operand operand) {
    Random random(1);
    return build_in_place(session(), operand, random_known(random, operand.shape, 4, 4));
  }
  // A call that breaks every later rule too, and one that breaks none but what the matrix breaks.
  SmStatus quadratic(SmMatrix* m, std::int64_t p = 2) { return fn().qxsminvquadv(m, x_.data(), r_.data(), p, 22); }
  SmStatus aliased_quadratic(SmMatrix* m) { return fn().qxsminvquadv(m, r_.data(), r_.data(), kTooMany, 22); }
  SmStatus bilinear(SmMatrix* m, std::int64_t p = 2, std::int64_t q = 2) {
    return qxsminvbilin(m, x_.data(), x_.data(), r_.data(), p, q);
  }
  void expect_bilinear_alias(SmMatrix* m, SmStatus want) {
    EXPECT_EQ(qxsminvbilin(m, r_.data(), x_.data(), r_.data(), 0, kTooMany), want);
    EXPECT_EQ(qxsminvbilin(m, x_.data(), r_.data(), r_.data(), 2, 2), want);
    EXPECT_TRUE(r_.untouched());
  }
  std::vector<SmMatrix*> without_array();
  std::vector<double> x_ = std::vector<double>(64, 1.0);
  Output r_{16};
};
INSTANTIATE_BOTH_HOSTS(InverseVectorRefusalsTest);

// In state 5 or 6 without a separate array, of every kind that can say so.
std::vector<SmMatrix*> InverseVectorRefusalsTest::without_array() {
  std::vector<SmMatrix*> all;
  for (const Shape shape : kSquareFactored)
    for (const std::int32_t state : {SM_STATE_FACTORED, SM_STATE_INVERTED}) all.push_back(in_place({shape, state}));
  for (const Shape shape : kGeneralShapes) {
    all.push_back(of({shape}, 3, 5));
    all.back()->state = SM_STATE_FACTORED;  // no call brings a general matrix there
  }
  all.push_back(of({kSymmetricSparse, SM_STATE_FACTORED}));
  all.back()->row_start = nullptr;  // nor takes the rows from under a sparse factor; they go with their pool
  return all;
}

TEST_P(InverseVectorRefusalsTest, an_empty_matrix_answers_0_before_everything) {
  std::vector<SmMatrix*> empty{sized(kGeneralSparse, 3, 5), new_untyped(session())};
  for (const Shape shape : kShapes) {
    empty.push_back(typed(shape));
    empty.push_back(sized(shape, 0, 0));
  }
  for (SmMatrix* m : empty) {
    EXPECT_EQ(aliased_quadratic(m), SM_OK);
    expect_bilinear_alias(m, SM_OK);
    m->state = SM_STATE_FACTORED;
    EXPECT_EQ(aliased_quadratic(m), SM_OK);
    expect_bilinear_alias(m, SM_OK);
    m->state = SM_STATE_CLOSED;
  }
  EXPECT_TRUE(r_.untouched());
}

TEST_P(InverseVectorRefusalsTest, an_alias_comes_first_for_a_quadratic_form) {
  SmMatrix* none = new_untyped_with_an_entry(session(), SM_STATE_OPEN);
  EXPECT_EQ(aliased_quadratic(none), SM_BAD_ARGUMENT);
  EXPECT_EQ(aliased_quadratic(sized(kSymmetricSparse, 4)), SM_BAD_ARGUMENT);
  for (SmMatrix* m : without_array()) {
    EXPECT_EQ(aliased_quadratic(m), SM_BAD_ARGUMENT);
    if (m->kind == SM_KIND_GENERAL) m->state = SM_STATE_CLOSED;
  }
  for (const Operand& operand : all_operands()) EXPECT_EQ(aliased_quadratic(of(operand)), SM_BAD_ARGUMENT);
  EXPECT_TRUE(r_.untouched());
}

TEST_P(InverseVectorRefusalsTest, kind_none_comes_first_for_a_bilinear_form_and_is_one_of_many_for_a_quadratic_one) {
  SmMatrix* none = new_untyped_with_an_entry(session(), SM_STATE_OPEN);
  for (const std::int32_t state : {SM_STATE_OPEN, SM_STATE_CLOSED, SM_STATE_FACTORED}) {
    none->state = state;
    expect_bilinear_alias(none, SM_UNTYPED);
    EXPECT_EQ(quadratic(none, kTooMany), state == SM_STATE_OPEN     ? SM_NOT_CLOSED
                                         : state == SM_STATE_CLOSED ? SM_UNAVAILABLE
                                                                    : SM_NO_FACTOR);
  }
  EXPECT_TRUE(r_.untouched());
}

TEST_P(InverseVectorRefusalsTest, an_open_matrix_comes_next) {
  std::vector<double> data(15, 1.0);
  for (SmMatrix* m : {sized(kSymmetricSparse, 4), new_open_tied(session(), data, 3, 5, SM_KIND_GENERAL, SM_FORMAT_ROWS),
                      new_open_tied(session(), data, 4, 4, SM_KIND_SYMMETRIC, SM_FORMAT_COLUMNS),
                      new_open_tied(session(), data, 4, 4, SM_KIND_DIAGONAL, SM_FORMAT_ROWS)}) {
    EXPECT_EQ(quadratic(m, kTooMany), SM_NOT_CLOSED);
    expect_bilinear_alias(m, SM_NOT_CLOSED);
  }
  EXPECT_TRUE(r_.untouched());
}

TEST_P(InverseVectorRefusalsTest, a_missing_separate_array_comes_before_alias_shape_and_kind) {
  for (SmMatrix* m : without_array()) {
    SCOPED_TRACE(name_of(Operand{{m->kind, m->format}, m->state}));
    EXPECT_EQ(quadratic(m, kTooMany), SM_NO_FACTOR);
    EXPECT_EQ(quadratic(m, 0), SM_NO_FACTOR);
    expect_bilinear_alias(m, SM_NO_FACTOR);
    EXPECT_EQ(bilinear(m), SM_NO_FACTOR);
    if (m->kind == SM_KIND_GENERAL) m->state = SM_STATE_CLOSED;
  }
  EXPECT_TRUE(r_.untouched());
}

TEST_P(InverseVectorRefusalsTest, a_bilinear_result_that_is_an_input_comes_before_the_shape) {
  for (const Operand& operand : all_operands()) {
    SCOPED_TRACE(name_of(operand));
    SmMatrix* m = of(operand);
    expect_bilinear_alias(m, SM_BAD_ARGUMENT);
    EXPECT_EQ(m->state, operand.state);
    if (operand.shape.kind == SM_KIND_GENERAL) expect_bilinear_alias(of(operand, 3, 5), SM_BAD_ARGUMENT);
  }
}

TEST_P(InverseVectorRefusalsTest, a_general_matrix_is_not_served) {
  for (const Operand& operand : kGeneralOperands) {
    EXPECT_EQ(quadratic(of(operand, 3, 5), kTooMany), SM_UNAVAILABLE);
    EXPECT_EQ(quadratic(of(operand), 2), SM_UNAVAILABLE);
    EXPECT_EQ(bilinear(of(operand, 3, 5)), SM_NOT_SQUARE);
    EXPECT_TRUE(r_.untouched());
    Output r(6);
    EXPECT_EQ(qxsminvbilin(of(operand), x_.data(), x_.data(), r.data(), 2, 3), SM_UNAVAILABLE);
    EXPECT_TRUE(same(r.values(), std::vector<double>(6, 0.0)));
    EXPECT_EQ(qxsminvbilin(of(operand), x_.data(), x_.data(), r.data(), 0, kTooMany), SM_UNAVAILABLE);
  }
}

TEST_P(InverseVectorRefusalsTest, too_many_vectors_answer_105_before_anything_is_factored) {
  for (const Operand& operand : symmetric_and_diagonal()) {
    SCOPED_TRACE(name_of(operand));
    for (const std::int64_t count : {SM_MAX_ELEMENTS / 4 + 1, kTooMany, kHuge}) {
      SmMatrix* m = of(operand);
      EXPECT_EQ(quadratic(m, count), SM_TOO_LARGE);
      EXPECT_EQ(m->state, operand.state);
      if (operand.shape.kind == SM_KIND_SYMMETRIC) {
        EXPECT_EQ(bilinear(m, 0, count), SM_TOO_LARGE);
        EXPECT_EQ(m->state, operand.state);
      }
      destroy(m);
    }
    SmMatrix* m = of(operand);
    EXPECT_EQ(quadratic(m, SM_MAX_ELEMENTS / 4), SM_NO_MEMORY);  // 2^53 elements are allowed, if they can be had
    EXPECT_EQ(m->state, operand.state);
    if (operand.shape.kind == SM_KIND_SYMMETRIC) {
      EXPECT_EQ(bilinear(m, 0, SM_MAX_ELEMENTS / 4), SM_NO_MEMORY);
      EXPECT_EQ(m->state, operand.state);
    }
  }
  EXPECT_TRUE(r_.untouched());
}

TEST_P(InverseVectorRefusalsTest, a_factorization_that_fails_is_the_answer) {
  for (const Shape shape : {kSymmetricSparse, kSymmetricColumns, kSymmetricRows, kDiagonalColumns, kDiagonalRows}) {
    Known known(2, 2);
    known.set(0, 0, 4.0);
    known.set(1, 1, -3.0);
    SmMatrix* m = build(shape, known);
    const std::int64_t loose = host().live_blocks() - blocks_of(m);
    EXPECT_EQ(quadratic(m), SM_NOT_DEFINITE) << name_of(shape);
    EXPECT_TRUE(r_.untouched());
    Output r(4);
    EXPECT_EQ(qxsminvbilin(m, x_.data(), x_.data(), r.data(), 2, 2), SM_NOT_DEFINITE) << name_of(shape);
    EXPECT_TRUE(same(r.values(), std::vector<double>(4, 0.0)));
    EXPECT_EQ(host().live_blocks() - blocks_of(m), loose) << name_of(shape);
  }
}

TEST_P(InverseVectorRefusalsTest, an_inverse_in_format_22_cannot_be_solved_with) {
  SmMatrix* m = of({kSymmetricColumns, SM_STATE_INVERTED});
  const std::int64_t blocks = host().live_blocks();
  EXPECT_EQ(quadratic(m), SM_WRONG_STATE);
  EXPECT_TRUE(r_.untouched());
  Output r(4);
  EXPECT_EQ(qxsminvbilin(m, x_.data(), x_.data(), r.data(), 2, 2), SM_WRONG_STATE);
  EXPECT_TRUE(same(r.values(), std::vector<double>(4, 0.0)));
  EXPECT_EQ(host().live_blocks(), blocks);
}

}  // namespace
}  // namespace sm::test
