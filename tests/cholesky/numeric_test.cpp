#include <cmath>
#include <limits>

#include "cholesky/cholesky_support.hpp"
#include "cholesky/pivot_cases.hpp"

namespace sm::test {
namespace {

class NumericTest : public ModuleTest {
 protected:
  double tolerance() { return instance()->tolerances[2]; }
  // Symbolically factored (state 4), in natural order.
  SmMatrix* symbolic(const Problem& problem) {
    SmMatrix* m = new_sparse(session(), problem);
    EXPECT_EQ(qxsmmd(m), SM_OK);
    impose_order(m, natural_order(problem.n));
    EXPECT_EQ(qxsmreorder(m), SM_OK);
    EXPECT_EQ(qxsmsymbfact(m), SM_OK);
    return m;
  }
  void destroy(SmMatrix* m) { EXPECT_EQ(fn().qxsmDestroyMatrix(instance(), &m), SM_OK); }

  enum class Fate { accepted, dropped, refused };
  // What becomes of the last pivot.
  Fate last_pivot(const Problem& problem) {
    SmMatrix* m = symbolic(problem);
    const SmStatus status = qxsmnumfact(m);
    Fate fate = Fate::refused;
    if (status == SM_OK) {
      EXPECT_EQ(m->definite, 1);
      const bool accepted = m->factor_diag[problem.n - 1] != 0.0;
      EXPECT_EQ(m->rank, accepted ? problem.n : problem.n - 1);
      fate = accepted ? Fate::accepted : Fate::dropped;
    } else {
      EXPECT_EQ(status, SM_NOT_DEFINITE);
      EXPECT_EQ(m->definite, 0);
      EXPECT_EQ(m->state, SM_STATE_SYMBOLIC);
    }
    destroy(m);
    return fate;
  }
};
INSTANTIATE_BOTH_HOSTS(NumericTest);

void expect_reference_factor(const SmMatrix* m, const Problem& problem, double tolerance) {
  const Dense a = reordered(problem.dense(), words(m->perm, problem.n));
  const DenseFactor want = factor_with_drops(a, tolerance);
  ASSERT_TRUE(want.definite);
  EXPECT_EQ(m->state, SM_STATE_FACTORED);
  EXPECT_EQ(m->definite, 1);
  EXPECT_EQ(m->rank, want.rank);
  EXPECT_NEAR(m->log_det, static_cast<double>(want.log_det), 1e-10 * (1.0 + std::fabs(m->log_det)));
  const Dense u = stored_u(m);
  EXPECT_TRUE(near(u, want.u, 1e-10));
  Dense d(problem.n, problem.n);
  for (std::int64_t k = 0; k < problem.n; ++k) {
    ASSERT_EQ(m->factor_diag[k] != 0.0, want.accepted[at(k)]) << "pivot " << k;
    if (!want.accepted[at(k)]) continue;
    EXPECT_NEAR(m->factor_diag[k], static_cast<double>(1.0L / want.d[at(k)]), 1e-10 * m->factor_diag[k]);
    d(k, k) = 1.0L / m->factor_diag[k];
  }
  EXPECT_TRUE(near(product(product(transposed(u), d), u), a, 1e-11));
}

TEST_P(NumericTest, factors_definite_matrices_as_the_dense_reference_does) {
  for (std::uint64_t seed = 0; seed < 400; ++seed) {
    Random random(seed);
    const Problem problem = positive_definite(any_graph(random, 36), random);
    if (problem.n == 0) continue;
    SmMatrix* m = new_sparse(session(), problem);
    ASSERT_EQ(bring_to(m, SM_STATE_FACTORED), SM_OK);
    expect_reference_factor(m, problem, tolerance());
    EXPECT_EQ(m->rank, problem.n);
    EXPECT_NEAR(m->log_det, static_cast<double>(log_determinant(problem.dense())), 1e-9);
    destroy(m);
    if (HasFailure()) FAIL() << "seed " << seed;
  }
}

TEST_P(NumericTest, drops_the_dependent_columns_of_a_cross_product) {
  for (std::uint64_t seed = 0; seed < 400; ++seed) {
    Random random(seed);
    const Semidefinite s = cross_product(random, 1 + random.below(20), random.below(6), random.below(4));
    SmMatrix* m = new_sparse(session(), s.problem);
    ASSERT_EQ(qxsmmd(m), SM_OK);
    if (random.chance(50)) impose_order(m, random.permutation(s.problem.n));
    ASSERT_EQ(bring_to(m, SM_STATE_FACTORED), SM_OK) << "seed " << seed;
    expect_reference_factor(m, s.problem, tolerance());
    EXPECT_EQ(m->rank, s.rank) << "seed " << seed;
    std::vector<bool> accepted(at(s.problem.n));
    for (std::int64_t k = 0; k < s.problem.n; ++k) accepted[at(m->perm[k])] = m->factor_diag[k] != 0.0;
    EXPECT_NEAR(m->log_det, static_cast<double>(log_determinant(principal(s.problem.dense(), accepted))), 1e-9);
    destroy(m);
    if (HasFailure()) FAIL() << "seed " << seed;
  }
}

TEST_P(NumericTest, of_equal_columns_the_first_in_the_new_order_is_kept) {
  const Problem problem = problem_of({{4, 4, 2}, {4, 4, 2}, {2, 2, 9}});
  SmMatrix* m = new_sparse(session(), problem);
  ASSERT_EQ(qxsmmd(m), SM_OK);
  impose_order(m, {1, 2, 0});
  ASSERT_EQ(bring_to(m, SM_STATE_FACTORED), SM_OK);
  EXPECT_EQ(stored_reciprocals(m), (std::vector<double>{0.25, 0.125, 0.0}));
  EXPECT_EQ(m->rank, 2);
  EXPECT_DOUBLE_EQ(m->log_det, std::log(4.0) + std::log(8.0));
}

TEST_P(NumericTest, stores_the_factor_behind_the_subscripts) {
  Random random(2);
  SmMatrix* m = new_sparse(session(), positive_definite(grid(5, 4), random));
  ASSERT_EQ(bring_to(m, SM_STATE_FACTORED), SM_OK);
  std::int64_t* values_begin = m->work + 3 * 20 + 2 + m->factor_iju[19];
  EXPECT_EQ(m->factor_scratch, values_begin);
  EXPECT_EQ(static_cast<void*>(m->factor_diag), static_cast<void*>(values_begin + 20));
  EXPECT_EQ(static_cast<void*>(m->factor_values), static_cast<void*>(values_begin + 40));
  EXPECT_EQ(m->factor_iju, m->work);
  EXPECT_EQ(m->factor_iu, m->work + 20);
  EXPECT_EQ(m->factor_ju, m->work + 61);
}

TEST_P(NumericTest, stores_the_entries_of_u_negated) {
  SmMatrix* m = symbolic(problem_of({{4, 2}, {2, 5}}));
  ASSERT_EQ(qxsmnumfact(m), SM_OK);
  EXPECT_EQ(stored_reciprocals(m), (std::vector<double>{0.25, 0.25}));
  EXPECT_EQ(m->factor_values[0], -0.5);
}

TEST_P(NumericTest, leaves_the_stored_rows_alone_and_takes_no_memory) {
  Random random(3);
  SmMatrix* m = symbolic(positive_definite(grid(4, 4), random));
  const StoredRows rows = rows_of(m);
  const std::int64_t* work = m->work;
  const std::int64_t blocks = host().live_blocks();
  host().fail_request(0, true);
  EXPECT_EQ(qxsmnumfact(m), SM_OK);
  EXPECT_EQ(host().stop_failing(), 0);
  EXPECT_EQ(host().live_blocks(), blocks);
  EXPECT_EQ(m->work, work);
  EXPECT_TRUE(rows_of(m) == rows);
}

TEST_P(NumericTest, a_pivot_of_exactly_the_diagonal_times_the_tolerance_is_dropped) {
  const std::vector<ExactThreshold> cases = exact_thresholds(tolerance(), 12);
  ASSERT_EQ(cases.size(), 12U);
  const double unit = std::ldexp(1.0, -26);
  for (const ExactThreshold& c : cases) {
    EXPECT_EQ(last_pivot(bordered(c.a, c.steps, unit)), Fate::dropped) << c.a;
    EXPECT_EQ(last_pivot(bordered(c.a, c.steps - 1, unit)), Fate::accepted) << c.a;
    EXPECT_EQ(last_pivot(bordered(c.a, c.steps + 1, unit)), Fate::dropped) << c.a;
  }
}

TEST_P(NumericTest, the_tolerance_is_the_third_setting_of_the_instance) {
  instance()->tolerances[0] = 0.5;
  instance()->tolerances[1] = 0.5;
  instance()->tolerances[3] = 0.5;
  EXPECT_EQ(last_pivot(problem_of({{1, 0.9375}, {0.9375, 1}})), Fate::accepted);  // 0.121
  instance()->tolerances[2] = 0.125;
  EXPECT_EQ(last_pivot(problem_of({{1, 0.9375}, {0.9375, 1}})), Fate::dropped);
  // 0.25 - 0.125 against 0.125: relative to the diagonal, not absolute.
  EXPECT_EQ(last_pivot(bordered(0.25, 2, 0.25)), Fate::accepted);
  EXPECT_EQ(last_pivot(bordered(4.0, 56, 0.25)), Fate::dropped);  // 0.5 = 4 / 8
  EXPECT_EQ(last_pivot(bordered(4.0, 55, 0.25)), Fate::accepted);
}

TEST_P(NumericTest, a_pivot_down_to_a_tenth_below_zero_is_dropped) {
  EXPECT_EQ(last_pivot(problem_of({{-0.1}})), Fate::dropped);
  EXPECT_EQ(last_pivot(problem_of({{std::nextafter(-0.1, -1.0)}})), Fate::refused);
  EXPECT_EQ(last_pivot(problem_of({{1, 0}, {0, -0.05}})), Fate::dropped);
  EXPECT_EQ(last_pivot(problem_of({{1, 0}, {0, -0.2}})), Fate::refused);
  EXPECT_EQ(last_pivot(problem_of({{0.0}})), Fate::dropped);
  EXPECT_EQ(last_pivot(problem_of({{-0.0}})), Fate::dropped);
  EXPECT_EQ(last_pivot(problem_of({{std::numeric_limits<double>::min()}})), Fate::accepted);
  EXPECT_EQ(last_pivot(bordered(1.0, 4096 + 384, 1.0 / 64)), Fate::dropped);  // -0.09375
  EXPECT_EQ(last_pivot(bordered(1.0, 4096 + 448, 1.0 / 64)), Fate::refused);  // -0.109375
}

TEST_P(NumericTest, with_a_large_diagonal_the_limit_below_zero_is_a_hundred_tolerances_of_it) {
  const double big = std::ldexp(1.0, 40);  // times the tolerance 1.2207
  const std::int64_t steps = std::int64_t{1} << 40;
  EXPECT_EQ(last_pivot(bordered(big, steps - 2, 1.0)), Fate::accepted);
  EXPECT_EQ(last_pivot(bordered(big, steps - 1, 1.0)), Fate::dropped);
  EXPECT_EQ(last_pivot(bordered(big, steps + 1, 1.0)), Fate::dropped);
  EXPECT_EQ(last_pivot(bordered(big, steps + 122, 1.0)), Fate::dropped);
  EXPECT_EQ(last_pivot(bordered(big, steps + 123, 1.0)), Fate::refused);

  instance()->tolerances[2] = 0.125;  // limit -12.5 for a diagonal of 1
  EXPECT_EQ(last_pivot(bordered(1.0, 55296, 1.0 / 64)), Fate::dropped);
  EXPECT_EQ(last_pivot(bordered(1.0, 55297, 1.0 / 64)), Fate::refused);
}

TEST_P(NumericTest, the_two_limits_meet_where_the_diagonal_times_the_tolerance_is_a_tenth) {
  instance()->tolerances[2] = 0.1;  // limit -10
  EXPECT_EQ(last_pivot(bordered(1.0, 6, 1.0)), Fate::dropped);
  EXPECT_EQ(last_pivot(bordered(1.0, 12, 1.0)), Fate::refused);
  instance()->tolerances[2] = std::nextafter(0.1, 0.0);  // limit -0.1
  EXPECT_EQ(last_pivot(bordered(1.0, 6, 1.0)), Fate::refused);
  // The magnitude of the diagonal counts: |-4| / 8 makes the limit -50.
  instance()->tolerances[2] = 0.125;
  EXPECT_EQ(last_pivot(problem_of({{-4.0}})), Fate::dropped);
}

TEST_P(NumericTest, a_pivot_that_is_not_a_number_is_dropped) {
  Problem problem = problem_of({{4, 2, 0}, {2, 1, 2}, {0, 2, 8}});
  problem.upper[2].value = std::nan("");
  SmMatrix* m = symbolic(problem);
  EXPECT_EQ(qxsmnumfact(m), SM_OK);
  EXPECT_EQ(m->definite, 1);
  EXPECT_EQ(m->rank, 2);
  EXPECT_EQ(stored_reciprocals(m), (std::vector<double>{0.25, 0.0, 0.125}));
  EXPECT_DOUBLE_EQ(m->log_det, std::log(4.0) + std::log(8.0));
}

TEST_P(NumericTest, the_row_of_a_dropped_pivot_updates_nothing) {
  // The pivot of row 1 is 1 - 1 = 0, and its remaining entry with row 2 is 3 - 1 = 2.
  SmMatrix* m = symbolic(problem_of({{1, 1, 1}, {1, 1, 3}, {1, 3, 9}}));
  EXPECT_EQ(qxsmnumfact(m), SM_OK);
  EXPECT_EQ(stored_reciprocals(m), (std::vector<double>{1.0, 0.0, 0.125}));
  EXPECT_EQ(m->rank, 2);
  EXPECT_EQ(stored_u(m)(1, 2), 0.0L);
}

TEST_P(NumericTest, a_negative_pivot_leaves_the_symbolic_factor_for_a_second_try) {
  const Problem bad = problem_of({{4, 2, 0}, {2, 0.5, 1}, {0, 1, 8}});
  SmMatrix* m = symbolic(bad);
  const std::vector<Indices> structure = stored_structure(m);
  EXPECT_EQ(qxsmnumfact(m), SM_NOT_DEFINITE);
  EXPECT_EQ(m->definite, 0);
  EXPECT_EQ(m->state, SM_STATE_SYMBOLIC);
  EXPECT_EQ(qxsmnumfact(m), SM_NOT_DEFINITE);
  EXPECT_EQ(stored_structure(m), structure);
  for (std::int64_t p = m->row_start[1]; p < m->row_start[2]; ++p)
    if (m->col_index[p] == 1) m->nz_values[p] = 5.0;
  EXPECT_EQ(qxsmnumfact(m), SM_OK);
  expect_reference_factor(m, problem_of({{4, 2, 0}, {2, 5, 1}, {0, 1, 8}}), tolerance());
}

TEST_P(NumericTest, answers_101_when_the_room_for_the_values_is_too_small) {
  Random random(4);
  const Problem problem = positive_definite(grid(4, 3), random);
  SmMatrix* m = symbolic(problem);
  const std::int64_t capacity = m->work_capacity;
  m->work_capacity = words_needed(m) - 1;
  EXPECT_EQ(qxsmnumfact(m), SM_NO_MEMORY);
  EXPECT_EQ(m->state, SM_STATE_SYMBOLIC);
  m->work_capacity = words_needed(m);
  EXPECT_EQ(qxsmnumfact(m), SM_OK);
  m->work_capacity = capacity;
  expect_reference_factor(m, problem, tolerance());
}

TEST_P(NumericTest, its_checks_come_in_order) {
  EXPECT_EQ(qxsmnumfact(new_sparse(session(), Problem{"empty", 0, {}}, false)), SM_OK);
  SmMatrix* none = new_untyped(session());
  EXPECT_EQ(qxsmnumfact(none), SM_OK);
  none->nnz = 1;
  none->state = SM_STATE_FACTORED;
  EXPECT_EQ(qxsmnumfact(none), SM_OK);  // state 5 before the kind
  for (const std::int32_t state : {SM_STATE_OPEN, SM_STATE_CLOSED, SM_STATE_SYMBOLIC, SM_STATE_INVERTED}) {
    none->state = state;
    EXPECT_EQ(qxsmnumfact(none), SM_UNTYPED);
  }
  none->nnz = 0;
  none->state = SM_STATE_OPEN;

  SmMatrix* m = new_sparse(session(), problem_of({{2, 1}, {1, 2}}), false);
  EXPECT_EQ(qxsmnumfact(m), SM_NOT_CLOSED);
  ASSERT_EQ(fn().qxsmclose(m, 0.0), SM_OK);
  EXPECT_EQ(qxsmnumfact(m), SM_WRONG_STATE);
  ASSERT_EQ(qxsmmd(m), SM_OK);
  EXPECT_EQ(qxsmnumfact(m), SM_WRONG_STATE);
  ASSERT_EQ(qxsmreorder(m), SM_OK);
  EXPECT_EQ(qxsmnumfact(m), SM_WRONG_STATE);
  EXPECT_EQ(m->state, SM_STATE_REORDERED);
  ASSERT_EQ(qxsmsymbfact(m), SM_OK);
  EXPECT_EQ(qxsmnumfact(m), SM_OK);
  const std::vector<double> reciprocals = stored_reciprocals(m);
  m->factor_diag[0] = 7.0;  // seen again afterwards: the second call computes nothing
  EXPECT_EQ(qxsmnumfact(m), SM_OK);
  EXPECT_EQ(m->factor_diag[0], 7.0);
  m->factor_diag[0] = reciprocals[0];
}

TEST_P(NumericTest, what_is_not_symmetric_sparse_answers_102_below_state_5) {
  const Problem problem = problem_of({{2, 1}, {1, 2}});
  std::vector<double> data(3, 1.0);
  EXPECT_EQ(qxsmnumfact(new_open_tied(session(), data, 2, 2, SM_KIND_SYMMETRIC, SM_FORMAT_ROWS)), SM_NOT_CLOSED);
  SmMatrix* dense = new_packed(session(), problem, SM_FORMAT_COLUMNS);
  for (SmMatrix* m : {dense, new_general(session(), 2, 2), new_diagonal(session(), {1.0, 2.0})}) {
    EXPECT_EQ(qxsmnumfact(m), SM_WRONG_STATE);
    m->state = SM_STATE_SYMBOLIC;
    EXPECT_EQ(qxsmnumfact(m), SM_WRONG_STATE);
    m->state = SM_STATE_CLOSED;
  }
  std::vector<double> b{1.0, 1.0};
  std::vector<double> x(2);
  ASSERT_EQ(fn().qxsmsoldirect(dense, b.data(), x.data(), 1), SM_OK);
  EXPECT_EQ(dense->state, SM_STATE_INVERTED);
  EXPECT_EQ(qxsmnumfact(dense), SM_OK);  // above state 5
}

}  // namespace
}  // namespace sm::test
