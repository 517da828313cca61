// qxsmsolioc: when a right-hand side has converged, and what ends it otherwise.
#include <algorithm>

#include "iterative/conjugate_gradients_reference.hpp"

namespace sm::test {
namespace {

class ConvergenceTest : public ModuleTest {
 protected:
  SmMatrix* with(Shape shape, const Dense& a) { return build(session(), shape, a); }
  // The steps that a solve reports.
  std::vector<Step> recorded(SmMatrix* m, const std::vector<double>& b, const Limits& limits) {
    Recorder recorder;
    EXPECT_EQ(qxsmsetprogress(instance(), Recorder::record, &recorder), SM_OK);
    solve(m, b, limits);
    EXPECT_EQ(qxsmsetprogress(instance(), nullptr, nullptr), SM_OK);
    return recorder.steps;
  }
};
INSTANTIATE_BOTH_HOSTS(ConvergenceTest);

double first_rho(const Dense& a, const std::vector<double>& b) {
  return static_cast<double>(conjugate_gradients(a, b, 0).rho[0]);
}

TEST_P(ConvergenceTest, comes_with_the_first_step_whose_rho_is_within_the_square_of_the_tolerance) {
  Random random(121);
  const Dense a = positive_definite(grid(6, 5), random).dense();
  const std::vector<double> b = random.vector(30);
  const double start = first_rho(a, b);
  for (const Shape shape : kSymmetricShapes) {
    SmMatrix* m = with(shape, a);
    const std::vector<Step> steps = recorded(m, b, {0.0, 12, 1});
    ASSERT_EQ(steps.size(), 12U);
    double least = start;
    int records = 0;
    for (const Step& step : steps) {
      if (!(step.rho < 0.5 * least)) continue;
      // Halfway between this rho and the least before it, far from either: this is the first step within.
      const double bound = std::sqrt(least * step.rho);
      least = step.rho;
      ++records;
      const Solved s = solve(m, b, {std::sqrt(bound / start), 1000, 1});
      EXPECT_EQ(s.status, SM_OK);
      EXPECT_EQ(s.iterations, step.iteration) << name_of(shape);
      EXPECT_EQ(s.residual, step.rho);
    }
    EXPECT_GE(records, 6) << "steps that were told apart";
  }
}

TEST_P(ConvergenceTest, a_tolerance_of_1_or_more_is_met_before_the_first_step) {
  const Dense a = from_rows({{4, 1}, {1, 3}});
  for (const Shape shape : kSymmetricShapes)
    for (const double tolerance : {1.0, 2.0, 1e6}) {
      const Solved s = solve(with(shape, a), {1, 2}, {tolerance, 0, 1});
      EXPECT_EQ(s.status, SM_OK);
      EXPECT_EQ(s.x, (std::vector<double>{0, 0}));
      EXPECT_EQ(s.iterations, 0);
      EXPECT_DOUBLE_EQ(s.residual, 0.25 + 4.0 / 3.0);
    }
}

TEST_P(ConvergenceTest, an_exact_solution_meets_a_tolerance_of_0) {
  // The preconditioned matrix is the identity: nothing is left after one step.
  for (const Shape shape : kSymmetricShapes) {
    const Solved s = solve(with(shape, from_diagonal({1, 4, 16})), {1, 2, 4}, {0.0, 0, 1});
    EXPECT_EQ(s.status, SM_OK);
    EXPECT_EQ(s.iterations, 1);
    EXPECT_EQ(s.residual, 0.0);
    EXPECT_EQ(s.x, (std::vector<double>{1, 0.5, 0.25}));
  }
}

TEST_P(ConvergenceTest, a_right_hand_side_of_zeros_has_converged_at_the_start) {
  Random random(122);
  const Dense a = positive_definite(grid(3, 3), random).dense();
  for (const Shape shape : kSymmetricShapes)
    for (const double tolerance : {0.0, 1e-10, kNan}) {
      const Solved s = solve(with(shape, a), std::vector<double>(18, 0.0), {tolerance, 0, 2});
      EXPECT_EQ(s.status, SM_OK);
      EXPECT_EQ(s.x, std::vector<double>(18, 0.0));
      EXPECT_EQ(s.iterations, 0);
      EXPECT_EQ(s.residual, 0.0);
    }
}

TEST_P(ConvergenceTest, a_limit_below_1_stands_for_the_order_and_2) {
  const Dense a = ill_conditioned(8, 1e6);
  Random random(123);
  const std::vector<double> b = random.vector(8);
  for (const Shape shape : kSymmetricShapes) {
    SmMatrix* m = with(shape, a);
    for (const std::int64_t limit : {std::int64_t{0}, std::int64_t{-1}, std::numeric_limits<std::int64_t>::min()}) {
      const Solved s = solve(m, b, {0.0, limit, 1});
      EXPECT_EQ(s.status, SM_NOT_CONVERGED);
      EXPECT_EQ(s.iterations, 10) << name_of(shape) << ' ' << limit;
    }
    for (const std::int64_t limit : {1, 3, 9, 11}) EXPECT_EQ(solve(m, b, {0.0, limit, 1}).iterations, limit);
  }
}

TEST_P(ConvergenceTest, a_right_hand_side_that_does_not_converge_leaves_the_later_ones_0) {
  const Dense a = ill_conditioned(8, 1e4);
  Random random(124);
  // Zeros converge at once; the second one cannot in three steps; the third is never begun.
  std::vector<double> b(8, 0.0);
  const std::vector<double> hard = random.vector(8);
  b.insert(b.end(), hard.begin(), hard.end());
  b.insert(b.end(), hard.begin(), hard.end());
  for (const Shape shape : kSymmetricShapes) {
    SmMatrix* m = with(shape, a);
    const Solved s = solve(m, b, {1e-12, 3, 3});
    const Solved alone = solve(m, hard, {1e-12, 3, 1});
    EXPECT_EQ(s.status, SM_NOT_CONVERGED);
    EXPECT_EQ(alone.status, SM_NOT_CONVERGED);
    std::vector<double> want(24, 0.0);
    std::copy(alone.x.begin(), alone.x.end(), want.begin() + 8);
    EXPECT_EQ(s.x, want) << "the last iterate, and zeros behind it";
    EXPECT_TRUE(near(alone.x, conjugate_gradients(a, hard, 3).iterates[2], 1e-9));
    EXPECT_EQ(s.iterations, 3);
    EXPECT_EQ(s.residual, alone.residual);
    EXPECT_GT(s.residual, 0.0);
  }
}

TEST_P(ConvergenceTest, converging_with_the_last_step_allowed_is_converging) {
  for (const Shape shape : kSymmetricShapes) {
    const Solved s = solve(with(shape, from_diagonal({1, 4})), {1, 2}, {1e-8, 1, 1});
    EXPECT_EQ(s.status, SM_OK);
    EXPECT_EQ(s.iterations, 1);
  }
}

TEST_P(ConvergenceTest, a_negative_tolerance_or_a_nan_selects_setting_2) {
  Random random(125);
  const Dense a = positive_definite(grid(5, 5), random).dense();
  const std::vector<double> b = random.vector(25);
  for (const Shape shape : kSymmetricShapes)
    for (const double setting : {kSingular, 1e-3, 0.25}) {
      SmMatrix* m = with(shape, a);
      const Solved want = solve(m, b, {setting, 1000, 1});
      const double kept = instance()->tolerances[2];
      instance()->tolerances[2] = setting;
      for (const double tolerance : {-1.0, -1e-300, -kInfinity, kNan}) {
        const Solved s = solve(m, b, {tolerance, 1000, 1});
        EXPECT_EQ(s.status, SM_OK);
        EXPECT_EQ(s.iterations, want.iterations) << tolerance;
        EXPECT_EQ(s.residual, want.residual);
        EXPECT_EQ(s.x, want.x);
      }
      instance()->tolerances[2] = kept;
    }
}

TEST_P(ConvergenceTest, a_tolerance_does_not_reach_the_preconditioner) {
  // With a tolerance of 0.5 and diagonal elements far below it, one step with the full preconditioner solves it.
  for (const Shape shape : kSymmetricShapes) {
    const Solved s = solve(with(shape, from_diagonal({1e-3, 1e-6, 1e-13})), {1, 1, 1}, {0.5, 0, 1});
    EXPECT_EQ(s.status, SM_OK);
    EXPECT_EQ(s.iterations, 1);
    EXPECT_TRUE(near(s.x, {1e3, 1e6, 1e13}, 1e-14));
  }
}

TEST_P(ConvergenceTest, a_direction_that_the_matrix_annihilates_stops_it) {
  // b is no combination of the columns, and p'Ap is 0 in the first step.
  for (const Shape shape : kSymmetricShapes) {
    const Solved s = solve(with(shape, from_rows({{1, 1}, {1, 1}})), {1, -1, 1, 1}, {1e-10, 100, 2});
    EXPECT_EQ(s.status, SM_NOT_CONVERGED);
    EXPECT_TRUE(std::isnan(s.residual));
    EXPECT_LE(s.iterations, 1);
    EXPECT_EQ(s.x[2], 0.0) << "the later right-hand side";
    EXPECT_EQ(s.x[3], 0.0);
  }
}

TEST_P(ConvergenceTest, a_nan_on_either_side_stops_it) {
  const Dense a = from_rows({{4, 1, 0}, {1, 3, 1}, {0, 1, 5}});
  for (const Shape shape : kSymmetricShapes) {
    for (std::size_t place = 0; place < 3; ++place) {
      std::vector<double> b{1, 2, 3, 1, 2, 3};
      b[place] = kNan;
      const Solved s = solve(with(shape, a), b, {1e-10, 50, 2});
      EXPECT_EQ(s.status, SM_NOT_CONVERGED) << name_of(shape) << ' ' << place;
      EXPECT_LE(s.iterations, 1);
      EXPECT_TRUE(std::isnan(s.residual));
      EXPECT_EQ((std::vector<double>(s.x.begin() + 3, s.x.end())), std::vector<double>(3, 0.0));
    }
    SmMatrix* broken = with(shape, a);
    ASSERT_EQ(fn().qxsmsetee(broken, kNan), SM_OK);
    const Solved s = solve(broken, {1, 2, 3}, {1e-10, 50, 1});
    EXPECT_EQ(s.status, SM_NOT_CONVERGED);
    EXPECT_LE(s.iterations, 1);
  }
}

TEST_P(ConvergenceTest, without_any_preconditioner_nothing_is_to_be_done) {
  // rho is 0 from the start when the whole diagonal is 0.
  for (const Shape shape : kSymmetricShapes) {
    const Solved s = solve(with(shape, from_rows({{0, 1}, {1, 0}})), {1, 2}, {1e-10, 0, 1});
    EXPECT_EQ(s.status, SM_OK);
    EXPECT_EQ(s.x, (std::vector<double>{0, 0}));
    EXPECT_EQ(s.iterations, 0);
    EXPECT_EQ(s.residual, 0.0);
  }
}

// Changes the right-hand side under the solver, which then tells where it looks at it.
struct Meddler {
  std::vector<double>* b;
  std::int64_t at_step;
  std::vector<double> rho;
  static std::int32_t meddle(void* context, double rho, std::int64_t, std::int64_t iteration) {
    auto* self = static_cast<Meddler*>(context);
    self->rho.push_back(rho);
    if (iteration == self->at_step) (*self->b)[0] += 1.0;
    return 0;
  }
};

TEST_P(ConvergenceTest, the_residual_is_computed_from_b_in_steps_1_51_and_101_only) {
  const Dense a = ill_conditioned(60, 1e8);
  Random random(126);
  const std::vector<double> b = random.vector(60);
  for (const Shape shape : kSymmetricShapes) {
    SmMatrix* m = with(shape, a);
    const std::vector<Step> calm = recorded(m, b, {0.0, 110, 1});
    ASSERT_EQ(calm.size(), 110U);
    for (const auto& [at_step, seen] :
         {std::pair<std::int64_t, std::size_t>{1, 51}, {49, 51}, {50, 51}, {51, 101}, {100, 101}}) {
      std::vector<double> mine = b;
      Meddler meddler{&mine, at_step, {}};
      ASSERT_EQ(qxsmsetprogress(instance(), Meddler::meddle, &meddler), SM_OK);
      solve(m, mine, {0.0, 110, 1});
      ASSERT_EQ(qxsmsetprogress(instance(), nullptr, nullptr), SM_OK);
      ASSERT_EQ(meddler.rho.size(), 110U);
      std::size_t first = 0;
      while (first < 110 && meddler.rho[first] == calm[first].rho) ++first;
      EXPECT_EQ(first + 1, seen) << name_of(shape) << ": changed after step " << at_step;
    }
  }
}

}  // namespace
}  // namespace sm::test
