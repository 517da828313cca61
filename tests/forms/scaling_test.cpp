// qxsmmults: stored values of every kind, and its checks.
#include <cmath>

#include "forms/forms_support.hpp"

namespace sm::test {
namespace {

class ScalingTest : public FormsTest {
 protected:
  SmStatus scale(SmMatrix* m, double s) { return fn().qxsmmults(m, s); }
};
INSTANTIATE_BOTH_HOSTS(ScalingTest);

Known scaled(const Known& a, double s) {
  Known k(a.rows(), a.cols());
  for (std::int64_t i = 0; i < a.rows(); ++i)
    for (std::int64_t j = 0; j < a.cols(); ++j)
      if (a.has(i, j)) k.set(i, j, a(i, j) * s);
  return k;
}

const double kFactors[] = {1.0, -1.0, 2.0, 0.5, -0.25, 0.0, -0.0, kNan, kInfinity, -kInfinity};

TEST_P(ScalingTest, every_stored_value_is_multiplied_and_none_comes_or_goes) {
  Random random(1);
  for (const Operand& operand : all_operands())
    for (const std::int64_t n : {1, 5, 17})
      for (const double s : kFactors) {
        SCOPED_TRACE(name_of(operand) + " times " + std::to_string(s));
        const Known known = random_known(random, operand.shape, n, n);
        SmMatrix* m = build(operand, known);
        const std::int64_t nnz = m->nnz;
        ASSERT_EQ(scale(m, s), SM_OK);
        EXPECT_TRUE(same_entries(read(m), scaled(known, s)));
        EXPECT_EQ(m->nnz, nnz);
        EXPECT_EQ(m->state, operand.state);
        destroy(m);
      }
}

TEST_P(ScalingTest, a_rectangular_matrix_is_scaled_whole) {
  Random random(2);
  for (const Shape shape : kGeneralShapes)
    for (const auto& [rows, cols] : {std::pair{3, 7}, std::pair{7, 3}}) {
      const Known known = random_known(random, shape, rows, cols);
      SmMatrix* m = build(shape, known);
      ASSERT_EQ(scale(m, -2.0), SM_OK);
      EXPECT_TRUE(same_entries(read(m), scaled(known, -2.0))) << name_of(shape);
    }
}

TEST_P(ScalingTest, a_tied_array_is_scaled_where_it_is) {
  std::vector<double> data{1.0, 2.0, 3.0, 4.0};
  SmMatrix* m = sized(kGeneralRows, 1, 1);
  ASSERT_EQ(qxsmtie(m, data.data(), 2, 2, SM_KIND_GENERAL, SM_FORMAT_ROWS), SM_OK);
  ASSERT_EQ(m->state, SM_STATE_CLOSED);
  ASSERT_EQ(scale(m, 3.0), SM_OK);
  EXPECT_TRUE(same(data, {3.0, 6.0, 9.0, 12.0}));
}

TEST_P(ScalingTest, by_1_changes_nothing_to_the_bit) {
  Random random(3);
  for (const Operand& operand : all_operands()) {
    SmMatrix* m = build(operand, random_known(random, operand.shape, 6, 6));
    const double log_det = m->log_det;
    const std::int64_t rank = m->rank;
    ASSERT_EQ(scale(m, 1.0), SM_OK);
    EXPECT_EQ(bits(m->log_det), bits(log_det)) << name_of(operand);
    EXPECT_EQ(m->rank, rank);
  }
}

TEST_P(ScalingTest, a_known_log_determinant_grows_by_the_rank_times_the_logarithm) {
  Known three(3, 3);
  for (std::int64_t i = 0; i < 3; ++i) three.set(i, i, 4.0);
  Known of_rank_two = three;
  of_rank_two.set(1, 1, 0.0);
  for (const Operand& operand : symmetric_and_diagonal()) {
    if (operand.state < SM_STATE_FACTORED) continue;
    for (const auto& [known, rank] : {std::pair{three, 3}, std::pair{of_rank_two, 2}})
      for (const double s : {2.0, 0.125, 1e300}) {
        SmMatrix* m = build(operand, known);
        ASSERT_EQ(m->rank, rank);
        const std::int16_t definite = m->definite;
        ASSERT_EQ(scale(m, s), SM_OK);
        EXPECT_NEAR(m->log_det, rank * (std::log(4.0) + std::log(s)), 1e-9) << name_of(operand);
        EXPECT_EQ(m->rank, rank);
        EXPECT_EQ(m->definite, definite);
        EXPECT_EQ(m->state, operand.state);
        double answer = 0.0;
        EXPECT_EQ(fn().qxsmlogdet(m, &answer), SM_OK);
        EXPECT_EQ(bits(answer), bits(m->log_det));
      }
  }
}

TEST_P(ScalingTest, a_factor_that_is_not_positive_leaves_the_log_determinant) {
  Random random(4);
  for (const Operand& operand : symmetric_and_diagonal()) {
    if (operand.state < SM_STATE_FACTORED) continue;
    for (const double s : {-1.0, -2.0, 0.0, -0.0, kNan, -kInfinity}) {
      SmMatrix* m = build(operand, random_known(random, operand.shape, 3, 3));
      const double log_det = m->log_det;
      ASSERT_EQ(scale(m, s), SM_OK);
      EXPECT_EQ(bits(m->log_det), bits(log_det)) << name_of(operand) << ' ' << s;
      EXPECT_EQ(m->rank, 3);
    }
  }
}

TEST_P(ScalingTest, an_unknown_log_determinant_or_rank_stays_unknown) {
  Random random(5);
  for (const Operand& operand : all_operands()) {
    SmMatrix* m = build(operand, random_known(random, operand.shape, 3, 3));
    m->log_det = std::nan("");
    m->rank = 3;
    const std::uint64_t unknown = bits(m->log_det);
    ASSERT_EQ(scale(m, 2.0), SM_OK);
    EXPECT_EQ(bits(m->log_det), unknown) << name_of(operand);
    m->log_det = 1.5;
    m->rank = -1;
    ASSERT_EQ(scale(m, 2.0), SM_OK);
    EXPECT_EQ(m->log_det, 1.5) << name_of(operand);
    EXPECT_EQ(m->rank, -1);
    m->rank = 0;
    ASSERT_EQ(scale(m, 2.0), SM_OK);
    EXPECT_EQ(m->log_det, 1.5);
    m->rank = 2;  // it is the two fields that count
    ASSERT_EQ(scale(m, 2.0), SM_OK);
    EXPECT_NEAR(m->log_det, 1.5 + 2.0 * std::log(2.0), 1e-15);
  }
}

TEST_P(ScalingTest, an_empty_matrix_answers_0_before_everything) {
  for (const Shape shape : kShapes)
    for (SmMatrix* m : {typed(shape), sized(shape, 0, 0)}) {
      m->log_det = 1.0;
      m->rank = 1;
      EXPECT_EQ(scale(m, 2.0), SM_OK) << name_of(shape);
      EXPECT_EQ(m->log_det, 1.0);
    }
  EXPECT_EQ(scale(sized(kGeneralSparse, 3, 4), 2.0), SM_OK);
  EXPECT_EQ(scale(new_untyped(session()), 2.0), SM_OK);
}

TEST_P(ScalingTest, kind_none_then_an_open_matrix_then_another_kind) {
  SmMatrix* none = new_untyped_with_an_entry(session(), SM_STATE_OPEN);
  none->log_det = 1.0;
  none->rank = 1;
  EXPECT_EQ(scale(none, 2.0), SM_UNTYPED);
  EXPECT_EQ(none->log_det, 1.0);

  SmMatrix* open = sized(kSymmetricSparse, 2);
  ASSERT_EQ(fn().qxsmassign(open, 0, 1, 0, 3.0), SM_OK);
  EXPECT_EQ(scale(open, 2.0), SM_NOT_CLOSED);
  EXPECT_EQ(read(open)(0, 1), 3.0);
  std::vector<double> data(16, 1.0);
  for (const Shape shape : kDense) {
    SmMatrix* tied = new_open_tied(session(), data, 4, 4, shape.kind, shape.format);
    EXPECT_EQ(scale(tied, 2.0), SM_NOT_CLOSED) << name_of(shape);
    tied->kind = 4;
    EXPECT_EQ(scale(tied, 2.0), SM_NOT_CLOSED);
    tied->kind = shape.kind;
  }
  EXPECT_TRUE(same(data, std::vector<double>(16, 1.0)));

  SmMatrix* unknown = sized(kGeneralRows, 2, 2);
  ASSERT_EQ(fn().qxsmassign(unknown, 0, 1, 0, 3.0), SM_OK);
  unknown->kind = 4;
  EXPECT_EQ(scale(unknown, 2.0), SM_UNAVAILABLE);
  unknown->kind = SM_KIND_GENERAL;
  EXPECT_EQ(read(unknown)(0, 1), 3.0);
}

TEST_P(ScalingTest, nothing_is_allocated) {
  Random random(6);
  for (const Operand& operand : all_operands()) {
    SmMatrix* m = build(operand, random_known(random, operand.shape, 9, 9));
    EXPECT_EQ(without_memory([&] { return scale(m, 2.0); }), SM_OK) << name_of(operand);
  }
}

}  // namespace
}  // namespace sm::test
