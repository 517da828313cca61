// qxsmsoldirect: closing, every kind, every check.
#include <cmath>
#include <cstring>

#include "cholesky/cholesky_support.hpp"

namespace sm::test {
namespace {

constexpr double kUntouched = -777.0;
constexpr std::int32_t kFormats[] = {SM_FORMAT_COLUMNS, SM_FORMAT_ROWS};

class DirectSolveTest : public ModuleTest {
 protected:
  SmStatus solve(SmMatrix* m, const std::vector<double>& b, std::vector<double>& x, std::int32_t count = 1) {
    return fn().qxsmsoldirect(m, b.data(), x.data(), count);
  }
  void destroy(SmMatrix* m) { EXPECT_EQ(fn().qxsmDestroyMatrix(instance(), &m), SM_OK); }
  // A separate array below state 5 that says nothing about the values.
  void make_stale(SmMatrix* m) {
    const auto count = static_cast<std::uint64_t>(m->nnz);
    m->dense_factor = static_cast<double*>(m->pool->allocate(m->pool, count * 8, 0));
    for (std::int64_t i = 0; i < m->nnz; ++i) m->dense_factor[i] = 1000.0;
  }
};
INSTANTIATE_BOTH_HOSTS(DirectSolveTest);

TEST_P(DirectSolveTest, closes_factors_and_solves_a_sparse_matrix_in_one_call) {
  for (std::uint64_t seed = 0; seed < 40; ++seed) {
    Random random(seed);
    const Problem problem = positive_definite(any_graph(random, 30), random);
    if (problem.n == 0) continue;
    const std::vector<double> b = random.vector(2 * problem.n);
    SmMatrix* m = new_sparse(session(), problem, false);
    std::vector<double> x(at(2 * problem.n + 1), kUntouched);
    ASSERT_EQ(solve(m, b, x, 2), SM_OK);
    EXPECT_EQ(m->state, SM_STATE_FACTORED);
    EXPECT_EQ(x.back(), kUntouched);
    x.pop_back();
    EXPECT_TRUE(near(product(problem.dense(), columns(x, problem.n)), columns(b, problem.n), 1e-13)) << "seed " << seed;
    destroy(m);
  }
}

TEST_P(DirectSolveTest, closing_drops_nothing) {
  instance()->tolerances[3] = 0.5;
  Problem problem = problem_of({{4, 1, 0}, {1, 4, 0}, {0, 0, 4}});
  problem.upper.push_back({0, 2, 0.0});
  problem.upper.push_back({1, 2, 1.0 / 64});
  SmMatrix* m = new_sparse(session(), problem, false);
  std::vector<double> x(3);
  ASSERT_EQ(solve(m, {1.0, 1.0, 1.0}, x), SM_OK);
  EXPECT_EQ(m->nnz, 6);
  EXPECT_TRUE(near(dense_of_rows(m), problem.dense(), 0.0));
}

TEST_P(DirectSolveTest, continues_from_every_state_of_a_sparse_matrix) {
  const Problem problem = problem_of({{4, 2, 0}, {2, 5, 1}, {0, 1, 8}});
  const std::vector<double> b{1.0, 2.0, 3.0};
  for (std::int32_t state = SM_STATE_CLOSED; state <= SM_STATE_FACTORED; ++state) {
    SmMatrix* m = new_sparse(session(), problem);
    ASSERT_EQ(bring_to(m, state), SM_OK);
    std::vector<double> x(3, kUntouched);
    ASSERT_EQ(solve(m, b, x), SM_OK);
    EXPECT_TRUE(near(product(problem.dense(), x), b, 1e-14));
    EXPECT_EQ(m->state, SM_STATE_FACTORED);
  }
}

TEST_P(DirectSolveTest, replaces_a_packed_matrix_by_its_inverse) {
  for (std::uint64_t seed = 0; seed < 40; ++seed) {
    Random random(seed);
    const std::int64_t n = 1 + random.below(16);
    const Problem problem = positive_definite(random_graph(random, n, 60), random);
    const std::vector<double> b = random.vector(3 * n);
    for (const std::int32_t format : kFormats)
      for (const bool factored : {false, true}) {
        SmMatrix* m = new_packed(session(), problem, format);
        if (factored) {
          ASSERT_EQ(fn().qxsmfact(m, 1), SM_OK);
        }
        std::vector<double> x(at(3 * n), kUntouched);
        ASSERT_EQ(solve(m, b, x, 3), SM_OK);
        EXPECT_EQ(m->state, SM_STATE_INVERTED);
        EXPECT_EQ(m->dense_factor, nullptr);
        EXPECT_EQ(m->rank, n);
        EXPECT_NEAR(m->log_det, static_cast<double>(log_determinant(problem.dense())), 1e-10);
        EXPECT_TRUE(near(dense_of_packed(m->values, n, format), inverse(problem.dense()), 1e-12)) << "seed " << seed;
        EXPECT_TRUE(near(product(problem.dense(), columns(x, n)), columns(b, n), 1e-11)) << "seed " << seed;
        std::vector<double> again(at(3 * n), kUntouched);
        ASSERT_EQ(solve(m, b, again, 3), SM_OK);  // with the inverse that is there
        EXPECT_EQ(bits(again), bits(x));
        EXPECT_EQ(fn().qxsmfact(m, 0), SM_INVERTED);
        destroy(m);
      }
  }
}

TEST_P(DirectSolveTest, keeps_the_values_when_there_is_a_separate_factor) {
  Random random(2);
  const Problem problem = positive_definite(random_graph(random, 8, 60), random);
  const std::vector<double> b = random.vector(8);
  for (const std::int32_t format : kFormats) {
    SmMatrix* m = new_packed(session(), problem, format);
    ASSERT_EQ(fn().qxsmfact(m, 0), SM_OK);
    const double log_det = m->log_det;
    const std::int64_t blocks = host().live_blocks();
    std::vector<double> x(8);
    ASSERT_EQ(solve(m, b, x), SM_OK);
    EXPECT_EQ(m->state, SM_STATE_INVERTED);
    EXPECT_EQ(host().live_blocks(), blocks);
    ASSERT_NE(m->dense_factor, nullptr);
    EXPECT_TRUE(near(dense_of_packed(m->values, 8, format), problem.dense(), 0.0));
    EXPECT_TRUE(near(dense_of_packed(m->dense_factor, 8, format), inverse(problem.dense()), 1e-12));
    EXPECT_TRUE(near(product(problem.dense(), x), b, 1e-12));
    EXPECT_EQ(m->rank, 8);
    EXPECT_NEAR(m->log_det, log_det, 1e-12);
  }
}

TEST_P(DirectSolveTest, a_stale_separate_array_is_filled_from_the_values_first) {
  const Problem problem = problem_of({{4, 2}, {2, 5}});
  for (const std::int32_t format : kFormats) {
    SmMatrix* m = new_packed(session(), problem, format);
    make_stale(m);
    std::vector<double> x(2);
    ASSERT_EQ(solve(m, {6.0, 7.0}, x), SM_OK);
    EXPECT_TRUE(near(x, {1.0, 1.0}, 1e-15));
    EXPECT_EQ(m->state, SM_STATE_INVERTED);
    ASSERT_NE(m->dense_factor, nullptr);
    EXPECT_TRUE(near(dense_of_packed(m->dense_factor, 2, format), inverse(problem.dense()), 1e-15));
    EXPECT_TRUE(near(dense_of_packed(m->values, 2, format), problem.dense(), 0.0));
  }
}

TEST_P(DirectSolveTest, a_singular_packed_matrix_gets_a_generalized_inverse) {
  for (std::uint64_t seed = 0; seed < 40; ++seed) {
    Random random(seed);
    const Semidefinite s = cross_product(random, 1 + random.below(10), 1 + random.below(5), random.below(3));
    const std::int64_t n = s.problem.n;
    const Dense a = s.problem.dense();
    const std::vector<double> b = product(a, random.vector(n));
    for (const std::int32_t format : kFormats)
      for (const bool factored : {false, true}) {
        SmMatrix* m = new_packed(session(), s.problem, format);
        if (factored) {
          ASSERT_EQ(fn().qxsmfact(m, 0), SM_OK);
        }
        std::vector<double> x(at(n));
        ASSERT_EQ(solve(m, b, x), SM_OK);
        EXPECT_EQ(m->rank, s.rank);
        EXPECT_TRUE(near(product(a, x), b, 1e-11)) << "seed " << seed;
        const Dense g = dense_of_packed(factored ? m->dense_factor : m->values, n, format);
        EXPECT_TRUE(near(product(product(a, g), a), a, 1e-11)) << "seed " << seed;
        EXPECT_TRUE(near(product(product(g, a), g), g, 1e-11)) << "seed " << seed;
        destroy(m);
      }
  }
}

TEST_P(DirectSolveTest, an_indefinite_packed_matrix_is_left_as_it_was) {
  const Problem problem = problem_of({{4, 1}, {1, -3}});
  for (const std::int32_t format : kFormats)
    for (const bool stale : {false, true}) {
      SmMatrix* m = new_packed(session(), problem, format);
      if (stale) make_stale(m);
      std::vector<double> x(2);
      EXPECT_EQ(solve(m, {1.0, 1.0}, x), SM_NOT_DEFINITE);
      EXPECT_EQ(m->state, SM_STATE_CLOSED);
      EXPECT_TRUE(near(dense_of_packed(m->values, 2, format), problem.dense(), 0.0));
      ASSERT_EQ(fn().qxsmassign(m, 1, 1, 0, 3.0), SM_OK);
      ASSERT_EQ(solve(m, {5.0, 4.0}, x), SM_OK);
      EXPECT_TRUE(near(x, {1.0, 1.0}, 1e-14));
    }
}

TEST_P(DirectSolveTest, without_right_hand_sides_a_packed_matrix_is_inverted_all_the_same) {
  for (const std::int32_t count : {0, -1}) {
    SmMatrix* m = new_packed(session(), problem_of({{4.0}}), SM_FORMAT_ROWS);
    std::vector<double> x(1, kUntouched);
    EXPECT_EQ(solve(m, {1.0}, x, count), SM_OK);
    EXPECT_EQ(m->state, SM_STATE_INVERTED);
    EXPECT_EQ(m->values[0], 0.25);
    EXPECT_EQ(x[0], kUntouched);
  }
}

TEST_P(DirectSolveTest, a_diagonal_matrix_is_divided_by_as_it_is_stored) {
  const double t = instance()->tolerances[2];
  const std::uint64_t limit_bits = UINT64_C(0xBF1A36E2EB1C432D);
  double limit = 0.0;
  std::memcpy(&limit, &limit_bits, sizeof limit);
  for (const std::int32_t format : kFormats) {
    SmMatrix* m = new_diagonal(session(), {4.0, t, std::nextafter(t, 1.0), limit, std::nan(""), 0.5}, format);
    const std::vector<double> values = doubles(m->values, 4);
    const double accepted = std::nextafter(t, 1.0);
    const std::vector<double> b{8.0, 1.0, 2.0, 1.0, 1.0, 1.0, 4.0, 9.0, 1.0, 9.0, 9.0, 2.0};
    std::vector<double> x(12, kUntouched);
    ASSERT_EQ(solve(m, b, x, 2), SM_OK);
    EXPECT_EQ(x, (std::vector<double>{2.0, 0.0, 2.0 / accepted, 0.0, 0.0, 2.0,  //
                                      1.0, 0.0, 1.0 / accepted, 0.0, 0.0, 4.0}));
    EXPECT_EQ(m->state, SM_STATE_CLOSED);
    EXPECT_EQ(m->definite, 1);
    EXPECT_EQ(doubles(m->values, 4), values);
    EXPECT_EQ(m->dense_factor, nullptr);

    SmMatrix* bad = new_diagonal(session(), {2.0, std::nextafter(limit, -1.0)}, format);
    EXPECT_EQ(solve(bad, b, x), SM_NOT_DEFINITE);
    EXPECT_EQ(bad->definite, 0);
    EXPECT_EQ(bad->state, SM_STATE_CLOSED);
  }
}

TEST_P(DirectSolveTest, a_diagonal_matrix_with_a_separate_factor_uses_its_values) {
  SmMatrix* m = new_diagonal(session(), {4.0, 16.0});
  ASSERT_EQ(fn().qxsmfact(m, 0), SM_OK);
  m->dense_factor[0] = 1000.0;
  std::vector<double> x(2);
  ASSERT_EQ(solve(m, {8.0, 8.0}, x), SM_OK);
  EXPECT_EQ(x, (std::vector<double>{2.0, 0.5}));
  EXPECT_EQ(m->state, SM_STATE_FACTORED);
}

TEST_P(DirectSolveTest, a_tied_matrix_that_is_still_open_is_closed_and_solved) {
  for (const std::int32_t format : kFormats) {
    std::vector<double> data = packed(problem_of({{4, 2}, {2, 5}}), format);
    SmMatrix* m = new_open_tied(session(), data, 2, 2, SM_KIND_SYMMETRIC, format);
    std::vector<double> x(2);
    ASSERT_EQ(solve(m, {6.0, 7.0}, x), SM_OK);
    EXPECT_TRUE(near(x, {1.0, 1.0}, 1e-15));
    EXPECT_EQ(m->state, SM_STATE_INVERTED);
    EXPECT_TRUE(near(dense_of_packed(data.data(), 2, format), inverse(problem_of({{4, 2}, {2, 5}}).dense()), 1e-15));
    std::vector<double> d{4.0, 8.0};
    SmMatrix* diagonal = new_open_tied(session(), d, 2, 2, SM_KIND_DIAGONAL, format);
    ASSERT_EQ(solve(diagonal, {8.0, 8.0}, x), SM_OK);
    EXPECT_EQ(x, (std::vector<double>{2.0, 1.0}));
    EXPECT_EQ(diagonal->state, SM_STATE_CLOSED);
  }
}

TEST_P(DirectSolveTest, its_checks_come_in_order) {
  std::vector<double> b{1.0, 1.0, 1.0};
  std::vector<double> x(3, kUntouched);
  std::vector<double> data(9, 1.0);
  SmMatrix* empty = new_sparse(session(), Problem{"empty", 0, {}}, false);
  EXPECT_EQ(solve(empty, b, b), SM_OK);
  EXPECT_EQ(empty->state, SM_STATE_OPEN);
  SmMatrix* none = new_untyped(session());
  EXPECT_EQ(solve(none, b, b), SM_OK);
  none->nnz = 1;
  EXPECT_EQ(solve(none, b, b), SM_UNTYPED);
  none->nnz = 0;

  SmMatrix* open = new_sparse(session(), problem_of({{4, 2}, {2, 5}}), false);
  EXPECT_EQ(solve(open, b, b), SM_BAD_ARGUMENT);
  EXPECT_EQ(open->state, SM_STATE_OPEN);  // the alias before closing
  SmMatrix* general = new_open_tied(session(), data, 3, 3, SM_KIND_GENERAL, SM_FORMAT_ROWS);
  EXPECT_EQ(solve(general, b, b), SM_BAD_ARGUMENT);
  EXPECT_EQ(solve(general, b, x), SM_UNAVAILABLE);
  EXPECT_EQ(general->state, SM_STATE_CLOSED);  // closing before the kind
  EXPECT_EQ(solve(new_general(session(), 3, 2), b, x), SM_UNAVAILABLE);

  SmMatrix* other = new_packed(session(), problem_of({{4, 2}, {2, 5}}), SM_FORMAT_ROWS);
  other->format = 24;
  EXPECT_EQ(solve(other, b, x), SM_UNAVAILABLE);
  EXPECT_EQ(other->state, SM_STATE_CLOSED);
  other->format = SM_FORMAT_ROWS;

  SmMatrix* negative = new_sparse(session(), problem_of({{4, 1}, {1, -3}}));
  EXPECT_EQ(solve(negative, b, x), SM_NOT_DEFINITE);
  EXPECT_EQ(negative->state, SM_STATE_SYMBOLIC);
  EXPECT_EQ(b, (std::vector<double>(3, 1.0)));
}

TEST_P(DirectSolveTest, without_right_hand_sides_a_sparse_matrix_is_factored_all_the_same) {
  SmMatrix* m = new_sparse(session(), problem_of({{4, 2}, {2, 5}}), false);
  std::vector<double> x(3, kUntouched);
  EXPECT_EQ(solve(m, {1.0, 1.0}, x, 0), SM_OK);
  EXPECT_EQ(m->state, SM_STATE_FACTORED);
  EXPECT_EQ(x[2], kUntouched);
}

TEST_P(DirectSolveTest, a_matrix_that_cannot_be_closed_answers_so_and_stays_open) {
  SmMatrix* m = new_sparse(session(), problem_of({{4, 2}, {2, 5}}), false);
  std::vector<double> x(2, kUntouched);
  host().fail_request(0, true);
  EXPECT_EQ(solve(m, {1.0, 1.0}, x), SM_NO_MEMORY);
  EXPECT_GT(host().stop_failing(), 0);
  EXPECT_EQ(m->state, SM_STATE_OPEN);
  EXPECT_EQ(solve(m, {6.0, 7.0}, x), SM_OK);
  EXPECT_TRUE(near(x, {1.0, 1.0}, 1e-15));
}

}  // namespace
}  // namespace sm::test
