// qxsmsubst: every kind, every check.
#include <cmath>
#include <limits>

#include "cholesky/cholesky_support.hpp"

namespace sm::test {
namespace {

constexpr double kUntouched = -777.0;

class SubstitutionTest : public ModuleTest {
 protected:
  // Every matrix kind that has a factor, factored apart from its values.
  std::vector<SmMatrix*> factored(const Problem& problem) {
    std::vector<SmMatrix*> all = {new_sparse(session(), problem), new_packed(session(), problem, SM_FORMAT_COLUMNS),
                                  new_packed(session(), problem, SM_FORMAT_ROWS)};
    for (SmMatrix* m : all) EXPECT_EQ(fn().qxsmfact(m, 0), SM_OK);
    return all;
  }
  SmMatrix* factored_diagonal(const std::vector<double>& d, std::int32_t in_place = 0) {
    SmMatrix* m = new_diagonal(session(), d);
    EXPECT_EQ(fn().qxsmfact(m, in_place), SM_OK);
    return m;
  }
  void destroy(SmMatrix* m) { EXPECT_EQ(fn().qxsmDestroyMatrix(instance(), &m), SM_OK); }
};
INSTANTIATE_BOTH_HOSTS(SubstitutionTest);

TEST_P(SubstitutionTest, a_product_with_the_matrix_gives_the_right_hand_sides_back) {
  for (std::uint64_t seed = 0; seed < 60; ++seed) {
    Random random(seed);
    const Problem problem = positive_definite(any_graph(random, 30), random);
    if (problem.n == 0) continue;
    const std::int64_t n = problem.n;
    const std::vector<double> b = random.vector(3 * n);
    for (SmMatrix* m : factored(problem)) {
      std::vector<double> x(at(3 * n + 1), kUntouched);
      ASSERT_EQ(fn().qxsmsubst(m, b.data(), x.data(), 3), SM_OK);
      EXPECT_EQ(x.back(), kUntouched);
      x.pop_back();
      EXPECT_TRUE(near(product(problem.dense(), columns(x, n)), columns(b, n), 1e-13)) << "seed " << seed;
      EXPECT_EQ(m->state, SM_STATE_FACTORED);
      std::vector<double> last(at(n));
      ASSERT_EQ(fn().qxsmsubst(m, b.data() + 2 * n, last.data(), 1), SM_OK);
      EXPECT_EQ(bits(last), bits(x.data() + 2 * n, n));
      destroy(m);
    }
  }
}

TEST_P(SubstitutionTest, right_hand_sides_in_the_range_are_met_whatever_was_dropped) {
  for (std::uint64_t seed = 0; seed < 60; ++seed) {
    Random random(seed);
    const Semidefinite s = cross_product(random, 1 + random.below(12), 1 + random.below(5), random.below(4));
    const std::int64_t n = s.problem.n;
    const Dense a = s.problem.dense();
    const std::vector<double> b = product(a, random.vector(n));
    for (SmMatrix* m : factored(s.problem)) {
      std::vector<double> x(at(n), kUntouched);
      ASSERT_EQ(fn().qxsmsubst(m, b.data(), x.data(), 1), SM_OK);
      EXPECT_TRUE(near(product(a, x), b, 1e-11)) << "seed " << seed;
      destroy(m);
    }
  }
}

TEST_P(SubstitutionTest, a_sparse_solution_is_zero_where_a_pivot_was_dropped) {
  Random random(5);
  const Semidefinite s = cross_product(random, 6, 4, 2);
  SmMatrix* m = factored(s.problem).front();
  const std::vector<double> b = random.vector(12);
  std::vector<double> x(12, kUntouched);
  ASSERT_EQ(fn().qxsmsubst(m, b.data(), x.data(), 1), SM_OK);
  std::int64_t dropped = 0;
  for (std::int64_t k = 0; k < 12; ++k) {
    if (m->factor_diag[k] != 0.0) continue;
    ++dropped;
    EXPECT_EQ(x[at(m->perm[k])], 0.0);
  }
  EXPECT_EQ(dropped, 6);
}

// The rule for packed factors: a dropped pivot passes its component on, forward and backward.
TEST_P(SubstitutionTest, a_packed_factor_passes_the_component_of_a_dropped_pivot_on_undivided) {
  // R = [1 2 3; 0 0 0; 0 0 2]: forward from (1, 5, 7) gives (1, 3, 2), backward (-8, 3, 1).
  const Problem problem = problem_of({{1, 2, 3}, {2, 4, 6}, {3, 6, 13}});
  const std::vector<double> b{1.0, 5.0, 7.0};
  for (const std::int32_t format : {SM_FORMAT_COLUMNS, SM_FORMAT_ROWS})
    for (const std::int32_t in_place : {0, 1}) {
      SmMatrix* m = new_packed(session(), problem, format);
      ASSERT_EQ(fn().qxsmfact(m, in_place), SM_OK);
      std::vector<double> x(3, kUntouched);
      ASSERT_EQ(fn().qxsmsubst(m, b.data(), x.data(), 1), SM_OK);
      EXPECT_TRUE(near(x, {-8.0, 3.0, 1.0}, 1e-14)) << format;
    }
}

TEST_P(SubstitutionTest, a_negative_diagonal_of_a_packed_factor_counts_as_dropped) {
  for (const std::int32_t format : {SM_FORMAT_COLUMNS, SM_FORMAT_ROWS}) {
    SmMatrix* m = new_packed(session(), problem_of({{4, 2}, {2, 5}}), format);
    ASSERT_EQ(fn().qxsmfact(m, 1), SM_OK);  // R = [2 1; 0 2]
    m->values[2] = -2.0;
    const std::vector<double> b{2.0, 5.0};
    std::vector<double> x(2);
    ASSERT_EQ(fn().qxsmsubst(m, b.data(), x.data(), 1), SM_OK);
    EXPECT_TRUE(near(x, {-1.5, 4.0}, 1e-15)) << format;
  }
}

TEST_P(SubstitutionTest, a_diagonal_solution_divides_by_the_squares_of_the_roots) {
  for (const std::int32_t in_place : {0, 1}) {
    SmMatrix* m = factored_diagonal({4.0, 0.0, 0.25}, in_place);
    const std::vector<double> b{8.0, 3.0, 1.0, -4.0, 1.0, 2.0};
    std::vector<double> x(6, kUntouched);
    ASSERT_EQ(fn().qxsmsubst(m, b.data(), x.data(), 2), SM_OK);
    EXPECT_EQ(x, (std::vector<double>{2.0, 0.0, 4.0, -1.0, 0.0, 8.0}));
  }
}

TEST_P(SubstitutionTest, a_factor_in_place_solves_as_a_separate_one_does) {
  Random random(4);
  const Problem problem = positive_definite(random_graph(random, 15, 50), random);
  const std::vector<double> b = random.vector(30);
  for (const std::int32_t format : {SM_FORMAT_COLUMNS, SM_FORMAT_ROWS}) {
    std::vector<double> x[2] = {std::vector<double>(30), std::vector<double>(30)};
    for (const std::int32_t in_place : {0, 1}) {
      SmMatrix* m = new_packed(session(), problem, format);
      ASSERT_EQ(fn().qxsmfact(m, in_place), SM_OK);
      ASSERT_EQ(fn().qxsmsubst(m, b.data(), x[in_place].data(), 2), SM_OK);
    }
    EXPECT_EQ(bits(x[0]), bits(x[1]));
  }
}

TEST_P(SubstitutionTest, gives_its_work_vector_back_and_changes_nothing_but_x) {
  Random random(6);
  const Problem problem = positive_definite(grid(4, 4), random);
  const std::vector<double> b = random.vector(16);
  const std::vector<double> kept = b;
  for (SmMatrix* m : factored(problem)) {
    std::vector<double> x(16);
    const std::int64_t blocks = host().live_blocks();
    const bool sparse = m->format == SM_FORMAT_SPARSE;
    const std::vector<std::uint64_t> factor =
        sparse ? bits(m->factor_diag, 16) : bits(m->dense_factor, static_cast<std::int64_t>(m->value_count));
    ASSERT_EQ(fn().qxsmsubst(m, b.data(), x.data(), 1), SM_OK);
    EXPECT_EQ(host().live_blocks(), blocks);
    EXPECT_EQ(b, kept);
    EXPECT_EQ(sparse ? bits(m->factor_diag, 16) : bits(m->dense_factor, static_cast<std::int64_t>(m->value_count)),
              factor);
  }
}

TEST_P(SubstitutionTest, without_right_hand_sides_a_symmetric_matrix_clears_one_vector) {
  const Problem problem = problem_of({{4, 2}, {2, 5}});
  const std::vector<double> b{1.0, 1.0, 1.0};
  for (const std::int32_t count : {0, -1, std::numeric_limits<std::int32_t>::min()}) {
    for (SmMatrix* m : factored(problem)) {
      std::vector<double> x(3, kUntouched);
      const std::int64_t blocks = host().live_blocks();
      EXPECT_EQ(fn().qxsmsubst(m, b.data(), x.data(), count), SM_OK);
      EXPECT_EQ(x, (std::vector<double>{0.0, 0.0, kUntouched}));
      EXPECT_EQ(host().live_blocks(), blocks);
    }
    std::vector<double> x(3, kUntouched);
    EXPECT_EQ(fn().qxsmsubst(factored_diagonal({4.0, 9.0}), b.data(), x.data(), count), SM_OK);
    EXPECT_EQ(x, (std::vector<double>(3, kUntouched)));
  }
}

TEST_P(SubstitutionTest, its_checks_come_in_order) {
  std::vector<double> b{1.0, 1.0};
  std::vector<double> x(2, kUntouched);
  const auto subst = [&](SmMatrix* m, double* out) { return fn().qxsmsubst(m, b.data(), out, 1); };
  // Empty before anything else: aliased, without a state.
  EXPECT_EQ(subst(new_sparse(session(), Problem{"empty", 0, {}}, false), b.data()), SM_OK);
  SmMatrix* none = new_untyped(session());
  EXPECT_EQ(subst(none, b.data()), SM_OK);
  none->nnz = 1;
  EXPECT_EQ(subst(none, b.data()), SM_UNTYPED);
  none->state = SM_STATE_CLOSED;
  EXPECT_EQ(subst(none, b.data()), SM_UNTYPED);
  none->nnz = 0;
  none->state = SM_STATE_OPEN;

  std::vector<double> data(4, 1.0);
  SmMatrix* open = new_open_tied(session(), data, 2, 2, SM_KIND_GENERAL, SM_FORMAT_ROWS);
  EXPECT_EQ(subst(open, b.data()), SM_NOT_CLOSED);
  SmMatrix* general = new_general(session(), 2, 2);
  EXPECT_EQ(subst(general, b.data()), SM_WRONG_STATE);
  general->state = SM_STATE_INVERTED;
  EXPECT_EQ(subst(general, b.data()), SM_WRONG_STATE);
  general->state = SM_STATE_FACTORED;
  EXPECT_EQ(subst(general, b.data()), SM_BAD_ARGUMENT);  // aliased before the kind
  EXPECT_EQ(subst(general, x.data()), SM_UNAVAILABLE);
  EXPECT_EQ(fn().qxsmsubst(general, b.data(), x.data(), 0), SM_UNAVAILABLE);  // the kind before the count
  general->state = SM_STATE_CLOSED;
  EXPECT_EQ(x, (std::vector<double>(2, kUntouched)));
  EXPECT_EQ(b, (std::vector<double>{1.0, 1.0}));

  SmMatrix* packed_matrix = factored(problem_of({{4, 2}, {2, 5}})).back();
  packed_matrix->format = 24;
  EXPECT_EQ(subst(packed_matrix, b.data()), SM_BAD_ARGUMENT);
  EXPECT_EQ(subst(packed_matrix, x.data()), SM_UNAVAILABLE);
  EXPECT_EQ(x, (std::vector<double>{0.0, 0.0}));  // cleared before the format is looked at
  EXPECT_EQ(fn().qxsmsubst(packed_matrix, b.data(), x.data(), 0), SM_UNAVAILABLE);
  packed_matrix->format = SM_FORMAT_ROWS;
}

TEST_P(SubstitutionTest, answers_102_in_every_state_but_5) {
  const Problem problem = problem_of({{4, 2}, {2, 5}});
  std::vector<double> b{1.0, 1.0};
  std::vector<double> x(2, kUntouched);
  for (std::int32_t state = SM_STATE_CLOSED; state <= SM_STATE_SYMBOLIC; ++state) {
    SmMatrix* m = new_sparse(session(), problem);
    ASSERT_EQ(bring_to(m, state), SM_OK);
    EXPECT_EQ(fn().qxsmsubst(m, b.data(), x.data(), 1), SM_WRONG_STATE);
    EXPECT_EQ(fn().qxsmsubst(m, b.data(), b.data(), 0), SM_WRONG_STATE);
    EXPECT_EQ(m->state, state);
  }
  EXPECT_EQ(fn().qxsmsubst(new_sparse(session(), problem, false), b.data(), b.data(), 1), SM_NOT_CLOSED);
  for (SmMatrix* m : {new_packed(session(), problem, SM_FORMAT_COLUMNS), new_packed(session(), problem, SM_FORMAT_ROWS),
                      new_diagonal(session(), {1.0, 2.0})})
    EXPECT_EQ(fn().qxsmsubst(m, b.data(), x.data(), 1), SM_WRONG_STATE);
  EXPECT_EQ(x, (std::vector<double>(2, kUntouched)));
}

TEST_P(SubstitutionTest, an_array_cannot_be_solved_onto_itself) {
  std::vector<double> b{1.0, 2.0};
  std::vector<SmMatrix*> all = factored(problem_of({{4, 2}, {2, 5}}));
  all.push_back(factored_diagonal({4.0, 9.0}));
  for (SmMatrix* m : all)
    for (const std::int32_t count : {1, 0, -1}) {
      EXPECT_EQ(fn().qxsmsubst(m, b.data(), b.data(), count), SM_BAD_ARGUMENT);
      EXPECT_EQ(b, (std::vector<double>{1.0, 2.0}));
    }
}

TEST_P(SubstitutionTest, a_stale_separate_array_is_no_factor) {
  std::vector<double> b{1.0, 2.0};
  std::vector<double> x(2, kUntouched);
  SmMatrix* m = new_diagonal(session(), {4.0, -1.0});
  EXPECT_EQ(fn().qxsmfact(m, 0), SM_NOT_DEFINITE);
  EXPECT_EQ(fn().qxsmsubst(m, b.data(), x.data(), 1), SM_WRONG_STATE);
  EXPECT_EQ(x, (std::vector<double>(2, kUntouched)));
}

}  // namespace
}  // namespace sm::test
