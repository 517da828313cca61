// qxsmmults: what becomes of a factor or an inverse.
#include <cmath>

#include "forms/forms_support.hpp"

namespace sm::test {
namespace {

class ScaledFactorTest : public FormsTest {
 protected:
  SmStatus scale(SmMatrix* m, double s) { return fn().qxsmmults(m, s); }
  // The inverse as solves with the unit vectors have it.
  Dense solved(SmMatrix* m);
};
INSTANTIATE_BOTH_HOSTS(ScaledFactorTest);

Dense ScaledFactorTest::solved(SmMatrix* m) {
  const std::int64_t n = m->rows;
  std::vector<double> b(at(n * n));
  for (std::int64_t i = 0; i < n; ++i) b[at(i * n + i)] = 1.0;
  Output x(n * n);
  EXPECT_EQ(qxsminvmultv(m, b.data(), x.data(), n), SM_OK);
  return columns(x.values(), n);
}

Dense times(Dense a, double s) {
  for (std::int64_t i = 0; i < a.rows(); ++i)
    for (std::int64_t j = 0; j < a.cols(); ++j) a(i, j) *= s;
  return a;
}

std::vector<double> separate_array(const SmMatrix* m) {
  return doubles(m->dense_factor, static_cast<std::int64_t>(m->value_count));
}

bool solvable(Operand operand) { return !(operand.shape == kSymmetricColumns && operand.state == SM_STATE_INVERTED); }

TEST_P(ScaledFactorTest, solves_after_a_positive_scale_are_those_of_the_scaled_matrix) {
  Random random(1);
  for (const Operand& operand : symmetric_and_diagonal())
    for (const double s : {3.0, 0.125, 1e-6, 7.25e8}) {
      if (!solvable(operand)) continue;
      SCOPED_TRACE(name_of(operand) + " times " + std::to_string(s));
      const Known known = random_known(random, operand.shape, 6, 6);
      SmMatrix* m = build(operand, known);
      ASSERT_EQ(scale(m, s), SM_OK);
      const Dense want = times(inverse(known.dense()), 1.0 / s);
      EXPECT_TRUE(near(times(solved(m), s), times(want, s), 1e-12));
      const std::vector<double> x = random.vector(12);
      Output r(3);
      ASSERT_EQ(fn().qxsminvquadv(m, x.data(), r.data(), 2, 22), SM_OK);
      const Dense form = product(product(transposed(columns(x, 6)), want), columns(x, 6));
      EXPECT_NEAR(r.values()[1] * s, static_cast<double>(form(0, 1)) * s, 1e-10);
      Output t(4);
      ASSERT_EQ(qxsminvbilin(m, x.data(), x.data(), t.data(), 2, 2), SM_OK);
      EXPECT_TRUE(near(times(columns(t.values(), 2), s), times(form, s), 1e-12));
      double log_det = 0.0;
      ASSERT_EQ(fn().qxsmlogdet(m, &log_det), SM_OK);
      EXPECT_NEAR(log_det, static_cast<double>(log_determinant(known.dense())) + 6.0 * std::log(s), 1e-9);
      destroy(m);
    }
}

TEST_P(ScaledFactorTest, a_separate_array_becomes_factor_or_inverse_of_the_scaled_matrix) {
  Random random(2);
  for (const Operand& operand : symmetric_and_diagonal()) {
    if (operand.shape == kSymmetricSparse || operand.state < SM_STATE_FACTORED) continue;
    SCOPED_TRACE(name_of(operand));
    const Known known = random_known(random, operand.shape, 5, 5);
    SmMatrix* m = build(operand, known);
    const std::vector<double> before = separate_array(m);
    double* const array = m->dense_factor;
    const std::int64_t blocks = host().live_blocks();
    ASSERT_EQ(scale(m, 6.0), SM_OK);
    EXPECT_EQ(m->dense_factor, array);
    EXPECT_EQ(host().live_blocks(), blocks);
    std::vector<double> want = before;
    for (double& v : want) v = operand.state == SM_STATE_FACTORED ? v * std::sqrt(6.0) : v / 6.0;
    EXPECT_TRUE(near(separate_array(m), want, 1e-14));
  }
}

TEST_P(ScaledFactorTest, dropped_pivots_stay_dropped) {
  Random random(3);
  const Semidefinite s = cross_product(random, 4, 3, 1);
  const Dense a = s.problem.dense();
  const std::int64_t n = s.problem.n;
  const std::vector<double> b = product(a, random.vector(n));
  for (SmMatrix* m : {new_sparse(session(), s.problem), new_packed(session(), s.problem, SM_FORMAT_COLUMNS),
                      new_packed(session(), s.problem, SM_FORMAT_ROWS)}) {
    ASSERT_EQ(fn().qxsmfact(m, 0), SM_OK);
    ASSERT_EQ(scale(m, 4.0), SM_OK);
    EXPECT_EQ(m->rank, 4);
    std::vector<double> x(at(n));
    ASSERT_EQ(qxsminvmultv(m, b.data(), x.data(), 1), SM_OK);
    EXPECT_TRUE(near(times(columns(product(a, x), n), 4.0), columns(b, n), 1e-11));
  }
  Known d(2, 2);
  d.set(0, 0, 0.0);
  d.set(1, 1, 4.0);
  for (const std::int32_t state : {SM_STATE_FACTORED, SM_STATE_INVERTED}) {
    SmMatrix* m = build({kDiagonalRows, state}, d);
    ASSERT_EQ(scale(m, 4.0), SM_OK);
    EXPECT_TRUE(same(separate_array(m), {0.0, state == SM_STATE_FACTORED ? 4.0 : 0.0625}));
  }
}

TEST_P(ScaledFactorTest, a_scale_that_is_not_positive_leaves_a_separate_array_and_the_state) {
  Random random(4);
  for (const Operand& operand : symmetric_and_diagonal()) {
    if (operand.shape == kSymmetricSparse || operand.state < SM_STATE_FACTORED) continue;
    for (const double s : {-1.0, -3.0, 0.0, -0.0, kNan, -kInfinity}) {
      SmMatrix* m = build(operand, random_known(random, operand.shape, 4, 4));
      const std::vector<std::uint64_t> before = bits(separate_array(m));
      const std::uint64_t log_det = bits(m->log_det);
      ASSERT_EQ(scale(m, s), SM_OK);
      EXPECT_EQ(bits(separate_array(m)), before) << name_of(operand) << ' ' << s;
      EXPECT_EQ(bits(m->log_det), log_det);
      EXPECT_EQ(m->rank, 4);
      EXPECT_EQ(m->state, operand.state);
    }
  }
}

TEST_P(ScaledFactorTest, what_replaced_the_values_is_multiplied_as_values_are) {
  Random random(5);
  for (const Shape shape : kSquareFactored)
    for (const std::int32_t state : {SM_STATE_FACTORED, SM_STATE_INVERTED})
      for (const double s : {4.0, -2.0}) {
        SmMatrix* m = build_in_place(session(), {shape, state}, random_known(random, shape, 4, 4));
        const std::int64_t count = static_cast<std::int64_t>(m->value_count);
        std::vector<double> want = doubles(m->values, count);
        for (double& v : want) v *= s;
        const double log_det = m->log_det;
        ASSERT_EQ(scale(m, s), SM_OK);
        EXPECT_TRUE(same(doubles(m->values, count), want)) << name_of(shape);
        EXPECT_EQ(m->dense_factor, nullptr);
        EXPECT_EQ(m->state, state);
        EXPECT_NEAR(m->log_det, s > 0.0 ? log_det + 4.0 * std::log(s) : log_det, 1e-12);
      }
}

// Reciprocal pivots of a sparse factor: positive ones are divided whatever the sign of the scale.
TEST_P(ScaledFactorTest, positive_reciprocal_pivots_of_a_sparse_factor_are_divided) {
  Random random(6);
  const Semidefinite s = cross_product(random, 4, 2, 1);
  for (const double by : {4.0, 0.5, -2.0, 0.0, kInfinity}) {
    SmMatrix* m = new_sparse(session(), s.problem);
    ASSERT_EQ(fn().qxsmfact(m, 0), SM_OK);
    const std::vector<double> before = stored_reciprocals(m);
    const Dense u = stored_u(m);
    ASSERT_EQ(scale(m, by), SM_OK);
    std::vector<double> want = before;
    for (double& v : want)
      if (v > 0.0) v /= by;
    EXPECT_TRUE(same(stored_reciprocals(m), want)) << by;
    EXPECT_TRUE(near(stored_u(m), u, 0.0));
    EXPECT_EQ(m->state, SM_STATE_FACTORED);
  }
}

TEST_P(ScaledFactorTest, reciprocal_pivots_that_are_negative_stay_in_a_second_call) {
  Random random(7);
  SmMatrix* m = build({kSymmetricSparse, SM_STATE_FACTORED}, random_known(random, kSymmetricSparse, 5, 5));
  ASSERT_EQ(scale(m, -2.0), SM_OK);
  const std::vector<double> negative = stored_reciprocals(m);
  for (const double v : negative) EXPECT_LT(v, 0.0);
  ASSERT_EQ(scale(m, -2.0), SM_OK);
  EXPECT_TRUE(same(stored_reciprocals(m), negative));
}

TEST_P(ScaledFactorTest, below_state_5_no_factor_is_touched) {
  Random random(8);
  const Known known = random_known(random, kSymmetricSparse, 5, 5);
  SmMatrix* m = build({kSymmetricSparse, SM_STATE_FACTORED}, known);
  ASSERT_EQ(fn().qxsmsetee(m, 0.0), SM_OK);  // its reciprocal pivots are those of before
  ASSERT_EQ(m->state, SM_STATE_SYMBOLIC);
  const std::vector<double> before = stored_reciprocals(m);
  ASSERT_EQ(scale(m, 2.0), SM_OK);
  EXPECT_TRUE(same(stored_reciprocals(m), before));
  EXPECT_TRUE(is_missing(m->log_det));

  Known indefinite(3, 3);
  for (std::int64_t i = 0; i < 3; ++i) indefinite.set(i, i, i == 2 ? -5.0 : 4.0);
  for (const Shape shape : kSquareFactored) {
    SmMatrix* refused = build(shape, indefinite);
    ASSERT_EQ(fn().qxsmfact(refused, 0), SM_NOT_DEFINITE);
    ASSERT_EQ(scale(refused, 2.0), SM_OK);
    EXPECT_EQ(refused->state, SM_STATE_CLOSED) << name_of(shape);
    ASSERT_EQ(fn().qxsmassign(refused, 2, 2, 0, 8.0), SM_OK);
    EXPECT_TRUE(near(solved(refused), times(identity(3), 0.125), 1e-15)) << name_of(shape);
  }
}

}  // namespace
}  // namespace sm::test
