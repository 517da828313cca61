// qxsmquadv and qxsmbilin: their checks, the order of these, and what is cleared by then.
#include "forms/forms_support.hpp"

namespace sm::test {
namespace {

class VectorFormsRefusalsTest : public FormsTest {
 protected:
  std::vector<double> x_ = std::vector<double>(64, 1.0);
};
INSTANTIATE_BOTH_HOSTS(VectorFormsRefusalsTest);

TEST_P(VectorFormsRefusalsTest, an_empty_matrix_answers_0_before_everything_and_leaves_the_result) {
  Output r(6);
  for (const Shape shape : kShapes)
    for (SmMatrix* m : {typed(shape), sized(shape, 0, 0)}) {
      EXPECT_EQ(fn().qxsmquadv(m, x_.data(), r.data(), 3, 5, 2), SM_OK) << name_of(shape);
      EXPECT_EQ(fn().qxsmbilin(m, r.data(), r.data(), r.data(), 2, 2), SM_OK) << name_of(shape);
    }
  SmMatrix* without_entries = sized(kGeneralSparse, 3, 5);
  EXPECT_EQ(fn().qxsmquadv(without_entries, x_.data(), r.data(), 3, 5, 2), SM_OK);
  EXPECT_EQ(fn().qxsmbilin(without_entries, r.data(), x_.data(), r.data(), 2, 2), SM_OK);
  EXPECT_TRUE(r.untouched());
}

TEST_P(VectorFormsRefusalsTest, kind_none_comes_before_an_open_matrix) {
  Output r(6);
  SmMatrix* none = new_untyped_with_an_entry(session(), SM_STATE_OPEN);
  none->rows = 2;  // and not square
  EXPECT_EQ(fn().qxsmquadv(none, x_.data(), r.data(), 3, 5, 2), SM_UNTYPED);
  EXPECT_EQ(fn().qxsmbilin(none, r.data(), x_.data(), r.data(), 2, 2), SM_UNTYPED);
  EXPECT_TRUE(r.untouched());
  none->rows = 0;
}

TEST_P(VectorFormsRefusalsTest, an_open_matrix_comes_before_one_that_is_not_square) {
  Output r(6);
  std::vector<double> data(16, 1.0);
  SmMatrix* rectangular = new_open_tied(session(), data, 3, 4, SM_KIND_GENERAL, SM_FORMAT_ROWS);
  EXPECT_EQ(fn().qxsmquadv(rectangular, x_.data(), r.data(), 3, 5, 2), SM_NOT_CLOSED);
  EXPECT_EQ(fn().qxsmbilin(rectangular, r.data(), x_.data(), r.data(), 2, 2), SM_NOT_CLOSED);
  SmMatrix* open = sized(kSymmetricSparse, 4);
  EXPECT_EQ(fn().qxsmquadv(open, x_.data(), r.data(), 3, 5, 2), SM_NOT_CLOSED);
  EXPECT_EQ(fn().qxsmbilin(open, r.data(), x_.data(), r.data(), 2, 2), SM_NOT_CLOSED);
  EXPECT_TRUE(r.untouched());
}

TEST_P(VectorFormsRefusalsTest, a_matrix_that_is_not_square_comes_before_range_alias_and_kind) {
  Output r(6);
  for (const Operand& operand : kGeneralOperands)
    for (SmMatrix* m : {of(operand, 3, 5), of(operand, 5, 3)}) {
      EXPECT_EQ(fn().qxsmquadv(m, x_.data(), r.data(), 3, 5, 2), SM_NOT_SQUARE) << name_of(operand);
      EXPECT_EQ(fn().qxsmquadv(m, x_.data(), r.data(), 1, 0, 2), SM_NOT_SQUARE) << name_of(operand);
      EXPECT_EQ(fn().qxsmbilin(m, r.data(), x_.data(), r.data(), 2, 2), SM_NOT_SQUARE) << name_of(operand);
      EXPECT_EQ(fn().qxsmbilin(m, x_.data(), x_.data(), r.data(), 2, 2), SM_NOT_SQUARE) << name_of(operand);
    }
  EXPECT_TRUE(r.untouched());
}

TEST_P(VectorFormsRefusalsTest, a_range_with_an_end_outside_or_reversed_answers_121) {
  for (const Operand& operand : all_operands()) {
    SmMatrix* m = of(operand);
    Output r(6);
    for (const auto& [c0, c1] : std::vector<std::pair<std::int64_t, std::int64_t>>{{1, 0},
                                                                                   {3, 1},
                                                                                   {-1, 2},
                                                                                   {-1, 3},
                                                                                   {-3, -1},
                                                                                   {1, 4},
                                                                                   {4, 4},
                                                                                   {4, 6},
                                                                                   {0, 4},
                                                                                   {0, kHuge},
                                                                                   {kLeast, 0},
                                                                                   {kLeast, kHuge},
                                                                                   {kHuge, kLeast},
                                                                                   {kHuge, kHuge},
                                                                                   {kLeast, kLeast}}) {
      EXPECT_EQ(fn().qxsmquadv(m, x_.data(), r.data(), 3, c0, c1), SM_DIMENSION_MISMATCH)
          << name_of(operand) << ' ' << c0 << ' ' << c1;
      EXPECT_EQ(fn().qxsmquadv(m, x_.data(), r.data(), 0, c0, c1), SM_DIMENSION_MISMATCH);
    }
    EXPECT_TRUE(r.untouched());
  }
}

TEST_P(VectorFormsRefusalsTest, without_vectors_a_quadratic_form_writes_nothing) {
  for (const Operand& operand : all_operands()) {
    SmMatrix* m = of(operand);
    Output r(10);
    for (const std::int64_t p : {std::int64_t{0}, std::int64_t{-1}, std::int64_t{-4}, kLeast}) {
      EXPECT_EQ(fn().qxsmquadv(m, x_.data(), r.data(), p, 0, 3), SM_OK) << name_of(operand) << ' ' << p;
    }
    EXPECT_TRUE(r.untouched());
  }
}

TEST_P(VectorFormsRefusalsTest, a_bilinear_result_that_is_an_input_answers_104_before_it_is_cleared) {
  std::vector<Operand> operands = all_operands();
  for (const Operand& operand : operands) {
    SmMatrix* m = of(operand);
    Output r(16);
    EXPECT_EQ(fn().qxsmbilin(m, r.data(), x_.data(), r.data(), 2, 2), SM_BAD_ARGUMENT) << name_of(operand);
    EXPECT_EQ(fn().qxsmbilin(m, x_.data(), r.data(), r.data(), 2, 2), SM_BAD_ARGUMENT) << name_of(operand);
    EXPECT_EQ(fn().qxsmbilin(m, r.data(), r.data(), r.data(), 0, 0), SM_BAD_ARGUMENT) << name_of(operand);
    EXPECT_TRUE(r.untouched());
  }
}

TEST_P(VectorFormsRefusalsTest, a_bilinear_form_of_a_general_matrix_answers_124_with_the_result_cleared) {
  for (const Operand& operand : kGeneralOperands) {
    Output r(6);
    EXPECT_EQ(fn().qxsmbilin(of(operand), x_.data(), x_.data(), r.data(), 2, 3), SM_UNAVAILABLE) << name_of(operand);
    EXPECT_TRUE(same(r.values(), std::vector<double>(6, 0.0)));
  }
}

TEST_P(VectorFormsRefusalsTest, without_vectors_on_one_side_a_bilinear_form_writes_nothing) {
  for (const Operand& operand : symmetric_and_diagonal()) {
    SmMatrix* m = of(operand);
    for (const auto& [p, q] : std::vector<std::pair<std::int64_t, std::int64_t>>{
             {0, 0}, {0, 3}, {3, 0}, {-1, 3}, {3, -1}, {-2, -3}, {-1, -1}, {kLeast, 1}, {1, kLeast}}) {
      Output r(16);
      EXPECT_EQ(fn().qxsmbilin(m, x_.data(), x_.data(), r.data(), p, q), SM_OK)
          << name_of(operand) << ' ' << p << ' ' << q;
      EXPECT_TRUE(r.untouched());
    }
  }
}

TEST_P(VectorFormsRefusalsTest, an_unknown_kind_answers_124) {
  SmMatrix* m = of({kSymmetricRows});
  Output r(6);
  m->kind = 4;
  EXPECT_EQ(fn().qxsmquadv(m, x_.data(), r.data(), 2, 0, 3), SM_UNAVAILABLE);
  EXPECT_TRUE(r.untouched());
  EXPECT_EQ(fn().qxsmbilin(m, x_.data(), x_.data(), r.data(), 2, 3), SM_UNAVAILABLE);
  EXPECT_TRUE(same(r.values(), std::vector<double>(6, 0.0)));
  m->kind = SM_KIND_SYMMETRIC;
}

}  // namespace
}  // namespace sm::test
