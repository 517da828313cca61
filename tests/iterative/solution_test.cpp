// qxsmsolioc: solutions, of every kind, format and state.
#include "iterative/conjugate_gradients_reference.hpp"

namespace sm::test {
namespace {

class SolutionTest : public ModuleTest {
 protected:
  SmMatrix* with(Shape shape, const Dense& a) { return build(session(), shape, a); }
};
INSTANTIATE_BOTH_HOSTS(SolutionTest);

TEST_P(SolutionTest, solves_definite_systems_of_every_format) {
  Random random(111);
  for (int round = 0; round < 12; ++round) {
    const Problem problem = positive_definite(any_graph(random, 30), random);
    if (problem.n == 0) continue;
    const Dense a = problem.dense();
    const std::vector<double> b = random.vector(3 * problem.n);
    const Dense want = product(inverse(a), columns(b, problem.n));
    for (const Shape shape : kSymmetricShapes) {
      SmMatrix* m = with(shape, a);
      const Snapshot before = snapshot(m);
      const Solved s = solve(m, b, {1e-14, 1000, 3});
      EXPECT_EQ(s.status, SM_OK);
      EXPECT_TRUE(near(columns(s.x, problem.n), want, 1e-11)) << name_of(shape) << " round " << round;
      EXPECT_TRUE(snapshot(m) == before) << "nothing is factored, nothing changes";
    }
  }
}

TEST_P(SolutionTest, a_sparse_matrix_may_be_ordered_or_factored) {
  Random random(112);
  const Problem problem = positive_definite(random_graph(random, 15, 40), random);
  const std::vector<double> b = random.vector(15);
  const Dense want = product(inverse(problem.dense()), columns(b, 15));
  for (std::int32_t state = SM_STATE_CLOSED; state <= SM_STATE_FACTORED; ++state) {
    SmMatrix* m = new_sparse(session(), problem);
    ASSERT_EQ(bring_to(m, state), SM_OK);
    const Solved s = solve(m, b, {1e-14, 1000, 1});
    EXPECT_EQ(s.status, SM_OK);
    EXPECT_TRUE(near(columns(s.x, 15), want, 1e-11)) << state;
    EXPECT_EQ(m->state, state);
  }
}

TEST_P(SolutionTest, reads_the_values_of_a_packed_matrix_whose_factor_or_inverse_is_kept_apart) {
  Random random(113);
  const Dense a = positive_definite(clique(6), random).dense();
  const std::vector<double> b = random.vector(6);
  const Dense want = product(inverse(a), columns(b, 6));
  for (const Shape shape : kPacked) {
    SmMatrix* factored = with(shape, a);
    ASSERT_EQ(fn().qxsmfact(factored, 0), SM_OK);
    SmMatrix* inverted = with(shape, a);
    ASSERT_EQ(fn().qxsminv(inverted, 0, kNan), SM_OK);
    for (SmMatrix* m : {factored, inverted}) {
      const Solved s = solve(m, b, {1e-14, 100, 1});
      EXPECT_EQ(s.status, SM_OK);
      EXPECT_TRUE(near(columns(s.x, 6), want, 1e-11)) << name_of(shape);
    }
  }
}

TEST_P(SolutionTest, of_a_singular_system_with_a_solution_is_one) {
  Random random(114);
  for (int round = 0; round < 8; ++round) {
    const Dense a = cross_product(random, 6, 4, 2).problem.dense();
    const std::vector<double> b = product(a, random.vector(12));
    for (const Shape shape : kSymmetricShapes) {
      const Solved s = solve(with(shape, a), b, {1e-12, 200, 1});
      EXPECT_EQ(s.status, SM_OK);
      EXPECT_TRUE(near(product(a, s.x), b, 1e-8)) << name_of(shape) << " round " << round;
    }
  }
}

TEST_P(SolutionTest, each_iterate_is_that_of_the_recurrence) {
  Random random(115);
  const Dense a = positive_definite(grid(4, 4), random).dense();
  const std::vector<double> b = random.vector(16);
  const Recurrence want = conjugate_gradients(a, b, 6);
  for (const Shape shape : kSymmetricShapes)
    for (std::int64_t k = 1; k <= 6; ++k) {
      const Solved s = solve(with(shape, a), b, {0.0, k, 1});
      EXPECT_EQ(s.status, SM_NOT_CONVERGED);
      EXPECT_EQ(s.iterations, k);
      EXPECT_TRUE(near(s.x, want.iterates[at(k - 1)], 1e-12)) << name_of(shape) << " step " << k;
      EXPECT_NEAR(s.residual, static_cast<double>(want.rho[at(k)]), 1e-9 * static_cast<double>(want.rho[at(k)]));
    }
}

TEST_P(SolutionTest, a_zero_on_the_diagonal_gets_no_preconditioner_and_is_corrected_through_the_products) {
  // Three rows with a preconditioner, one without, and one whose negative element is within the limit.
  const Dense a =
      from_rows({{4, 1, 1, 0, 1}, {1, 0, 2, 0, 3}, {1, 2, 8, 1, 2}, {0, 0, 1, -0.0625, 1}, {1, 3, 2, 1, 16}});
  const std::vector<double> b{1, 2, 3, 4, 5};
  const Recurrence want = conjugate_gradients(a, b, 2);
  for (const Shape shape : kSymmetricShapes)
    for (std::int64_t k = 1; k <= 2; ++k) {
      const Solved s = solve(with(shape, a), b, {0.0, k, 1});
      EXPECT_EQ(s.status, SM_NOT_CONVERGED);
      EXPECT_EQ(s.x[1], 0.0);
      EXPECT_EQ(s.x[3], 0.0);
      EXPECT_TRUE(near(s.x, want.iterates[at(k - 1)], 1e-12)) << name_of(shape) << " step " << k;
      EXPECT_NEAR(s.residual, static_cast<double>(want.rho[at(k)]), 1e-11);
    }
}

TEST_P(SolutionTest, of_a_diagonal_matrix_divides) {
  for (const Shape shape : kDiagonalShapes) {
    const double above = std::nextafter(kSingular, 1.0);
    SmMatrix* m = with(shape, from_diagonal({4, 1e-13, -8, 0, kSingular, -kSingular, above, -above}));
    std::vector<double> b(16, 1.0);
    for (std::size_t i = 8; i < 16; ++i) b[i] = static_cast<double>(i);
    const Solved s = solve(m, b, {1e-10, 0, 2});
    EXPECT_EQ(s.status, SM_OK);
    EXPECT_EQ(s.x, (std::vector<double>{0.25, 0, -0.125, 0, 0, 0, 1 / above, -1 / above,  //
                                        2, 0, -1.25, 0, 0, 0, 14 / above, -15 / above}));
    EXPECT_EQ(s.iterations, 0);
    EXPECT_EQ(s.residual, 0.0);
    EXPECT_EQ(m->state, SM_STATE_CLOSED);
  }
}

TEST_P(SolutionTest, of_a_diagonal_matrix_has_no_use_for_the_tolerance_or_the_limit) {
  SmMatrix* m = with(kDiagonalRows, from_diagonal({2, 1e-9}));
  for (const double tolerance : {0.0, 5.0, -1.0, kNan}) {
    const Solved s = solve(m, {1, 1}, {tolerance, 1, 1});
    EXPECT_EQ(s.status, SM_OK);
    EXPECT_EQ(s.x, (std::vector<double>{0.5, 1 / 1e-9}));
  }
  const Solved s = solve(m, {kNan, 4}, {0.0, 1, 1});
  EXPECT_EQ(s.status, SM_OK);
  EXPECT_TRUE(std::isnan(s.x[0]));
  EXPECT_EQ(s.x[1], 4 / 1e-9);
}

TEST_P(SolutionTest, several_right_hand_sides_are_solved_one_by_one) {
  Random random(116);
  const Dense a = positive_definite(grid(4, 3), random).dense();
  const std::vector<double> b = random.vector(48);
  for (const Shape shape : kSymmetricShapes) {
    SmMatrix* m = with(shape, a);
    const Solved all = solve(m, b, {1e-8, 100, 4});
    EXPECT_EQ(all.status, SM_OK);
    for (std::size_t v = 0; v < 4; ++v) {
      const auto from = static_cast<std::ptrdiff_t>(12 * v);
      const Solved one = solve(m, {b.begin() + from, b.begin() + from + 12}, {1e-8, 100, 1});
      EXPECT_EQ(one.x, (std::vector<double>(all.x.begin() + from, all.x.begin() + from + 12))) << name_of(shape);
      if (v == 3) {
        EXPECT_EQ(one.iterations, all.iterations) << "those of the last right-hand side";
        EXPECT_EQ(one.residual, all.residual);
      }
    }
  }
}

TEST_P(SolutionTest, what_x_holds_before_does_not_matter) {
  const Dense a = from_rows({{4, 1}, {1, 3}});
  for (const Shape shape : kSymmetricShapes) {
    SmMatrix* m = with(shape, a);
    const std::vector<double> b{1, 2};
    std::vector<double> x(2, kNan);
    std::int64_t iterations = 0;
    double residual = 0.0;
    ASSERT_EQ(fn().qxsmsolioc(m, b.data(), x.data(), 1, 0, &iterations, &residual, 1e-12), SM_OK);
    EXPECT_TRUE(near(product(a, x), b, 1e-12));
  }
}

TEST_P(SolutionTest, a_tied_array_is_only_read) {
  const Dense a = from_rows({{4, 1}, {1, 3}});
  for (const Shape shape : kSquareFactored) {
    std::vector<double> data = laid_out(shape, a);
    SmMatrix* m = new_tied(session(), shape, data, 2, 2);
    const Solved s = solve(m, {1, 2}, {1e-14, 0, 1});
    EXPECT_EQ(s.status, SM_OK);
    EXPECT_TRUE(near(product(contents(m), s.x), {1, 2}, 1e-14)) << name_of(shape);
    EXPECT_EQ(data, laid_out(shape, a));
  }
}

}  // namespace
}  // namespace sm::test
