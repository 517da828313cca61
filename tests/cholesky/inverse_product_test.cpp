// qxsminvmultv: the table of kinds and states, and its checks.
#include <cmath>

#include "cholesky/cholesky_support.hpp"

namespace sm::test {
namespace {

constexpr double kUntouched = -777.0;

class InverseProductTest : public ModuleTest {
 protected:
  // Inverted (state 6) in a separate array, with the values kept.
  SmMatrix* inverted_apart(const Problem& problem, std::int32_t format) {
    SmMatrix* m = new_packed(session(), problem, format);
    EXPECT_EQ(fn().qxsmfact(m, 0), SM_OK);
    const std::vector<double> b(at(problem.n), 1.0);
    std::vector<double> x(at(problem.n));
    EXPECT_EQ(fn().qxsmsoldirect(m, b.data(), x.data(), 1), SM_OK);
    EXPECT_EQ(m->state, SM_STATE_INVERTED);
    EXPECT_NE(m->dense_factor, nullptr);
    return m;
  }
};
INSTANTIATE_BOTH_HOSTS(InverseProductTest);

TEST_P(InverseProductTest, factors_when_needed_and_solves_for_every_right_hand_side) {
  Random random(3);
  const Problem problem = positive_definite(grid(4, 3), random);
  const std::vector<double> b = random.vector(36);
  for (SmMatrix* m : {new_sparse(session(), problem), new_packed(session(), problem, SM_FORMAT_COLUMNS),
                      new_packed(session(), problem, SM_FORMAT_ROWS)})
    for (int again = 0; again < 2; ++again) {
      std::vector<double> x(37, kUntouched);
      ASSERT_EQ(qxsminvmultv(m, b.data(), x.data(), 3), SM_OK);
      EXPECT_EQ(m->state, SM_STATE_FACTORED);
      EXPECT_EQ(x.back(), kUntouched);
      x.pop_back();
      EXPECT_TRUE(near(product(problem.dense(), columns(x, 12)), columns(b, 12), 1e-13));
      if (m->format != SM_FORMAT_SPARSE) {
        EXPECT_NE(m->dense_factor, nullptr);
        EXPECT_TRUE(near(dense_of_packed(m->values, 12, m->format), problem.dense(), 0.0));
      }
    }
  SmMatrix* diagonal = new_diagonal(session(), {4.0, 0.0, 16.0});
  for (int again = 0; again < 2; ++again) {
    std::vector<double> x(3, kUntouched);
    const std::vector<double> c{8.0, 5.0, 8.0};
    ASSERT_EQ(qxsminvmultv(diagonal, c.data(), x.data(), 1), SM_OK);
    EXPECT_EQ(x, (std::vector<double>{2.0, 0.0, 0.5}));
  }
}

TEST_P(InverseProductTest, continues_from_every_state_of_a_sparse_matrix) {
  const Problem problem = problem_of({{4, 2, 0}, {2, 5, 1}, {0, 1, 8}});
  const std::vector<double> b{1.0, 2.0, 3.0};
  for (std::int32_t state = SM_STATE_CLOSED; state <= SM_STATE_FACTORED; ++state) {
    SmMatrix* m = new_sparse(session(), problem);
    ASSERT_EQ(bring_to(m, state), SM_OK);
    std::vector<double> x(3, kUntouched);
    ASSERT_EQ(qxsminvmultv(m, b.data(), x.data(), 1), SM_OK);
    EXPECT_TRUE(near(product(problem.dense(), x), b, 1e-14));
  }
}

TEST_P(InverseProductTest, multiplies_by_a_stored_inverse_in_format_23) {
  Random random(9);
  const Problem problem = positive_definite(random_graph(random, 9, 60), random);
  SmMatrix* m = inverted_apart(problem, SM_FORMAT_ROWS);
  const std::vector<double> b = random.vector(27);
  std::vector<double> x(28, kUntouched);
  ASSERT_EQ(qxsminvmultv(m, b.data(), x.data(), 3), SM_OK);
  EXPECT_EQ(m->state, SM_STATE_INVERTED);
  EXPECT_EQ(x.back(), kUntouched);
  x.pop_back();
  EXPECT_TRUE(near(product(problem.dense(), columns(x, 9)), columns(b, 9), 1e-12));
  // It is the stored array that counts.
  for (std::int64_t i = 0; i < 45; ++i) m->dense_factor[i] = static_cast<double>(i);
  const Dense g = dense_of_packed(m->dense_factor, 9, SM_FORMAT_ROWS);
  x.assign(27, kUntouched);
  ASSERT_EQ(qxsminvmultv(m, b.data(), x.data(), 3), SM_OK);
  EXPECT_TRUE(near(columns(x, 9), product(g, columns(b, 9)), 1e-13));
}

TEST_P(InverseProductTest, a_stored_inverse_in_format_22_answers_102) {
  SmMatrix* m = inverted_apart(problem_of({{4, 2}, {2, 5}}), SM_FORMAT_COLUMNS);
  const std::vector<double> b{1.0, 2.0};
  std::vector<double> x(2, kUntouched);
  EXPECT_EQ(qxsminvmultv(m, b.data(), x.data(), 1), SM_WRONG_STATE);
  EXPECT_EQ(m->state, SM_STATE_INVERTED);
}

TEST_P(InverseProductTest, multiplies_by_a_stored_diagonal_inverse) {
  for (const std::int32_t format : {SM_FORMAT_COLUMNS, SM_FORMAT_ROWS}) {
    SmMatrix* m = new_diagonal(session(), {4.0, 0.0, 16.0}, format);
    ASSERT_EQ(fn().qxsmfact(m, 0), SM_OK);
    const std::vector<double> g{0.25, 0.0, 0.0625};
    for (std::size_t i = 0; i < 3; ++i) m->dense_factor[i] = g[i];
    m->state = SM_STATE_INVERTED;
    const std::vector<double> b{8.0, 5.0, 8.0, 4.0, 1.0, -16.0};
    std::vector<double> x(6, kUntouched);
    EXPECT_EQ(qxsminvmultv(m, b.data(), x.data(), 2), SM_OK);
    EXPECT_EQ(x, (std::vector<double>{2.0, 0.0, 0.5, 1.0, 0.0, -1.0}));
  }
}

TEST_P(InverseProductTest, answers_120_when_the_factor_or_inverse_took_the_place_of_the_values) {
  const std::vector<double> b{1.0, 2.0};
  std::vector<double> x(2, kUntouched);
  for (const std::int32_t format : {SM_FORMAT_COLUMNS, SM_FORMAT_ROWS}) {
    SmMatrix* factored = new_packed(session(), problem_of({{4, 2}, {2, 5}}), format);
    ASSERT_EQ(fn().qxsmfact(factored, 1), SM_OK);
    EXPECT_EQ(qxsminvmultv(factored, b.data(), x.data(), 1), SM_NO_FACTOR);
    SmMatrix* inverted = new_packed(session(), problem_of({{4, 2}, {2, 5}}), format);
    std::vector<double> y(2);
    ASSERT_EQ(fn().qxsmsoldirect(inverted, b.data(), y.data(), 1), SM_OK);
    ASSERT_EQ(inverted->dense_factor, nullptr);
    EXPECT_EQ(qxsminvmultv(inverted, b.data(), x.data(), 1), SM_NO_FACTOR);
    SmMatrix* diagonal = new_diagonal(session(), {4.0, 9.0}, format);
    ASSERT_EQ(fn().qxsmfact(diagonal, 1), SM_OK);
    EXPECT_EQ(qxsminvmultv(diagonal, b.data(), x.data(), 1), SM_NO_FACTOR);
  }
  EXPECT_EQ(x, (std::vector<double>(2, kUntouched)));
}

TEST_P(InverseProductTest, a_stale_separate_array_below_state_5_is_never_used) {
  const Problem problem = problem_of({{4, 2}, {2, 5}});
  const std::vector<double> b{6.0, 7.0};
  for (SmMatrix* m : {new_packed(session(), problem, SM_FORMAT_COLUMNS), new_packed(session(), problem, SM_FORMAT_ROWS),
                      new_diagonal(session(), {6.0, 7.0})}) {
    m->dense_factor = static_cast<double*>(m->pool->allocate(m->pool, 24, 0));
    for (std::int64_t i = 0; i < m->nnz; ++i) m->dense_factor[i] = 1000.0;
    std::vector<double> x(2, kUntouched);
    ASSERT_EQ(qxsminvmultv(m, b.data(), x.data(), 1), SM_OK);
    EXPECT_TRUE(near(x, {1.0, 1.0}, 1e-14));
  }
}

TEST_P(InverseProductTest, its_checks_come_in_order) {
  std::vector<double> b(9, 1.0);
  std::vector<double> x(9, kUntouched);
  std::vector<double> data(9, 1.0);
  const auto product_of = [&](SmMatrix* m, double* out) { return qxsminvmultv(m, b.data(), out, 1); };
  EXPECT_EQ(product_of(new_sparse(session(), Problem{"empty", 0, {}}, false), b.data()), SM_OK);
  SmMatrix* none = new_untyped(session());
  EXPECT_EQ(product_of(none, b.data()), SM_OK);
  none->nnz = 1;
  for (const std::int32_t state : {SM_STATE_OPEN, SM_STATE_FACTORED}) {
    none->state = state;
    EXPECT_EQ(product_of(none, b.data()), SM_UNTYPED);
  }
  none->nnz = 0;
  none->state = SM_STATE_OPEN;
  EXPECT_EQ(product_of(new_open_tied(session(), data, 3, 2, SM_KIND_GENERAL, SM_FORMAT_ROWS), b.data()), SM_NOT_CLOSED);
  EXPECT_EQ(product_of(new_sparse(session(), problem_of({{1.0}}), false), b.data()), SM_NOT_CLOSED);

  SmMatrix* general = new_general(session(), 3, 2);
  general->state = SM_STATE_FACTORED;
  EXPECT_EQ(product_of(general, b.data()), SM_NO_FACTOR);  // the missing array before the alias and the shape
  general->state = SM_STATE_CLOSED;
  EXPECT_EQ(product_of(general, b.data()), SM_BAD_ARGUMENT);  // the alias before the shape
  EXPECT_EQ(product_of(general, x.data()), SM_NOT_SQUARE);    // the shape before the kind
  EXPECT_EQ(x, (std::vector<double>(9, kUntouched)));
  EXPECT_EQ(product_of(new_general(session(), 3, 3), b.data()), SM_BAD_ARGUMENT);
  EXPECT_EQ(product_of(new_general(session(), 3, 3), x.data()), SM_UNAVAILABLE);
  EXPECT_EQ(b, (std::vector<double>(9, 1.0)));
}

TEST_P(InverseProductTest, all_of_x_is_cleared_before_the_kind_is_looked_at) {
  const std::vector<double> b(9, 1.0);
  std::vector<double> x(9, kUntouched);
  EXPECT_EQ(qxsminvmultv(new_general(session(), 3, 3), b.data(), x.data(), 2), SM_UNAVAILABLE);
  EXPECT_EQ(x, (std::vector<double>{0, 0, 0, 0, 0, 0, kUntouched, kUntouched, kUntouched}));
}

TEST_P(InverseProductTest, a_factorization_that_fails_is_the_answer_and_leaves_x_cleared) {
  const std::vector<double> b(4, 1.0);
  for (SmMatrix* m :
       {new_sparse(session(), problem_of({{4, 1}, {1, -3}})),
        new_packed(session(), problem_of({{4, 1}, {1, -3}}), SM_FORMAT_COLUMNS),
        new_packed(session(), problem_of({{4, 1}, {1, -3}}), SM_FORMAT_ROWS), new_diagonal(session(), {1.0, -3.0})}) {
    std::vector<double> x(5, kUntouched);
    EXPECT_EQ(qxsminvmultv(m, b.data(), x.data(), 2), SM_NOT_DEFINITE);
    EXPECT_EQ(x, (std::vector<double>{0.0, 0.0, 0.0, 0.0, kUntouched}));
    EXPECT_EQ(m->definite, 0);
  }
}

TEST_P(InverseProductTest, the_solves_take_the_low_half_of_the_count) {
  const Problem problem = problem_of({{4, 2}, {2, 5}});
  const std::vector<double> b{6.0, 7.0, 4.0, 2.0};
  const std::int64_t two = (std::int64_t{-1} << 32) + 2;  // below 1: nothing is cleared; 2 in the low half
  for (SmMatrix* m : {new_sparse(session(), problem), new_packed(session(), problem, SM_FORMAT_COLUMNS),
                      new_packed(session(), problem, SM_FORMAT_ROWS)}) {
    std::vector<double> x(5, kUntouched);
    EXPECT_EQ(qxsminvmultv(m, b.data(), x.data(), two), SM_OK);
    EXPECT_TRUE(near(x, {1.0, 1.0, 1.0, 0.0, kUntouched}, 1e-14));
    x.assign(5, kUntouched);
    EXPECT_EQ(qxsminvmultv(m, b.data(), x.data(), 0), SM_OK);
    EXPECT_EQ(x, (std::vector<double>{0.0, 0.0, kUntouched, kUntouched, kUntouched}));
  }
}

}  // namespace
}  // namespace sm::test
