// Values that change after factoring: no stale factor is ever used.
#include <cmath>

#include "cholesky/cholesky_support.hpp"

namespace sm::test {
namespace {

class ChangedValuesTest : public ModuleTest {
 protected:
  std::vector<double> solve(SmMatrix* m, const std::vector<double>& b) {
    std::vector<double> x(b.size(), std::nan(""));
    EXPECT_EQ(qxsminvmultv(m, b.data(), x.data(), 1), SM_OK);
    return x;
  }
  void expect_void(const SmMatrix* m) {
    EXPECT_EQ(m->rank, 0);
    EXPECT_TRUE(is_missing(m->log_det));
  }
};
INSTANTIATE_BOTH_HOSTS(ChangedValuesTest);

TEST_P(ChangedValuesTest, an_assignment_gives_the_separate_factor_of_a_packed_matrix_back) {
  for (const std::int32_t format : {SM_FORMAT_COLUMNS, SM_FORMAT_ROWS})
    for (const std::int32_t add : {0, 1}) {
      SmMatrix* m = new_packed(session(), problem_of({{4, 2}, {2, 5}}), format);
      const std::int64_t blocks = host().live_blocks();
      ASSERT_EQ(fn().qxsmfact(m, 0), SM_OK);
      ASSERT_EQ(fn().qxsmassign(m, 0, 0, add, 8.0), SM_OK);
      EXPECT_EQ(m->state, SM_STATE_CLOSED);
      EXPECT_EQ(m->dense_factor, nullptr);
      EXPECT_EQ(host().live_blocks(), blocks);
      expect_void(m);
      const Dense now = problem_of({{add ? 12.0 : 8.0, 2}, {2, 5}}).dense();
      double log_det = 0.0;
      EXPECT_EQ(fn().qxsmlogdet(m, &log_det), SM_OK);
      EXPECT_NEAR(log_det, static_cast<double>(log_determinant(now)), 1e-14);
      EXPECT_TRUE(near(product(now, solve(m, {3.0, -1.0})), {3.0, -1.0}, 1e-14));
    }
}

TEST_P(ChangedValuesTest, an_assignment_gives_the_separate_factor_of_a_diagonal_matrix_back) {
  SmMatrix* m = new_diagonal(session(), {4.0, 9.0});
  const std::int64_t blocks = host().live_blocks();
  ASSERT_EQ(fn().qxsmfact(m, 0), SM_OK);
  ASSERT_EQ(fn().qxsmassign(m, 1, 1, 0, 16.0), SM_OK);
  EXPECT_EQ(m->state, SM_STATE_CLOSED);
  EXPECT_EQ(m->dense_factor, nullptr);
  EXPECT_EQ(host().live_blocks(), blocks);
  expect_void(m);
  EXPECT_EQ(solve(m, {8.0, 8.0}), (std::vector<double>{2.0, 0.5}));
}

TEST_P(ChangedValuesTest, setting_every_entry_gives_a_separate_factor_back) {
  for (SmMatrix* m :
       {new_packed(session(), problem_of({{4, 2}, {2, 5}}), SM_FORMAT_COLUMNS),
        new_packed(session(), problem_of({{4, 2}, {2, 5}}), SM_FORMAT_ROWS), new_diagonal(session(), {4.0, 9.0})}) {
    const std::int64_t blocks = host().live_blocks();
    ASSERT_EQ(fn().qxsmfact(m, 0), SM_OK);
    ASSERT_EQ(fn().qxsmsetee(m, 3.0), SM_OK);
    EXPECT_EQ(m->state, SM_STATE_CLOSED);
    EXPECT_EQ(m->dense_factor, nullptr);
    EXPECT_EQ(host().live_blocks(), blocks);
    expect_void(m);
    std::int64_t rank = 0;
    EXPECT_EQ(fn().qxsmrank(m, &rank), SM_OK);
    EXPECT_EQ(rank, m->kind == SM_KIND_SYMMETRIC ? 1 : 2);
  }
}

TEST_P(ChangedValuesTest, a_separate_inverse_goes_back_as_well) {
  for (const std::int32_t format : {SM_FORMAT_COLUMNS, SM_FORMAT_ROWS}) {
    SmMatrix* m = new_packed(session(), problem_of({{4, 2}, {2, 5}}), format);
    const std::int64_t blocks = host().live_blocks();
    const std::vector<double> b{1.0, 1.0};
    std::vector<double> x(2);
    ASSERT_EQ(fn().qxsmfact(m, 0), SM_OK);
    ASSERT_EQ(fn().qxsmsoldirect(m, b.data(), x.data(), 1), SM_OK);
    ASSERT_EQ(m->state, SM_STATE_INVERTED);
    ASSERT_NE(m->dense_factor, nullptr);
    ASSERT_EQ(fn().qxsmassign(m, 0, 1, 0, 0.0), SM_OK);
    EXPECT_EQ(m->state, SM_STATE_CLOSED);
    EXPECT_EQ(m->dense_factor, nullptr);
    EXPECT_EQ(host().live_blocks(), blocks);
    expect_void(m);
    EXPECT_TRUE(near(solve(m, {4.0, 10.0}), {1.0, 2.0}, 1e-15));
  }
}

TEST_P(ChangedValuesTest, what_was_factored_or_inverted_in_place_keeps_its_state) {
  SmMatrix* factored = new_packed(session(), problem_of({{4, 2}, {2, 5}}), SM_FORMAT_ROWS);
  ASSERT_EQ(fn().qxsmfact(factored, 1), SM_OK);
  ASSERT_EQ(fn().qxsmassign(factored, 0, 0, 0, 3.0), SM_OK);
  EXPECT_EQ(factored->state, SM_STATE_FACTORED);
  EXPECT_EQ(factored->values[0], 3.0);
  expect_void(factored);

  SmMatrix* diagonal = new_diagonal(session(), {4.0, 9.0});
  ASSERT_EQ(fn().qxsmfact(diagonal, 1), SM_OK);
  ASSERT_EQ(fn().qxsmsetee(diagonal, 2.0), SM_OK);
  EXPECT_EQ(diagonal->state, SM_STATE_FACTORED);
  expect_void(diagonal);
  const std::vector<double> b{4.0, 8.0};
  std::vector<double> x(2);
  EXPECT_EQ(fn().qxsmsubst(diagonal, b.data(), x.data(), 1), SM_OK);
  EXPECT_EQ(x, (std::vector<double>{1.0, 2.0}));  // the values are the roots, as set

  SmMatrix* inverted = new_packed(session(), problem_of({{4, 2}, {2, 5}}), SM_FORMAT_ROWS);
  ASSERT_EQ(fn().qxsmsoldirect(inverted, b.data(), x.data(), 1), SM_OK);
  ASSERT_EQ(fn().qxsmassign(inverted, 0, 0, 1, 1.0), SM_OK);
  EXPECT_EQ(inverted->state, SM_STATE_INVERTED);
  expect_void(inverted);
}

TEST_P(ChangedValuesTest, setting_every_entry_of_a_factored_sparse_matrix_keeps_the_structure_and_asks_for_new_values) {
  SmMatrix* m = new_sparse(session(), problem_of({{4, 0, 0}, {0, 9, 2}, {0, 2, 9}}));
  ASSERT_EQ(fn().qxsmfact(m, 0), SM_OK);
  ASSERT_EQ(fn().qxsmsetee(m, 2.0), SM_OK);
  EXPECT_EQ(m->state, SM_STATE_SYMBOLIC);
  expect_void(m);
  const std::vector<double> b{2.0, 6.0, 6.0};
  std::vector<double> x(3);
  EXPECT_EQ(fn().qxsmsubst(m, b.data(), x.data(), 1), SM_WRONG_STATE);
  double log_det = 0.0;
  EXPECT_EQ(fn().qxsmlogdet(m, &log_det), SM_OK);  // [2] and [2 2; 2 2]: rank 2, both pivots 2
  EXPECT_NEAR(log_det, std::log(4.0), 1e-15);
  EXPECT_EQ(m->rank, 2);
  EXPECT_EQ(fn().qxsmsubst(m, b.data(), x.data(), 1), SM_OK);
  EXPECT_EQ(x[0], 1.0);
  EXPECT_EQ(x[1] + x[2], 3.0);
}

TEST_P(ChangedValuesTest, setting_every_entry_below_state_5_leaves_the_state_of_a_sparse_matrix) {
  for (std::int32_t state = SM_STATE_CLOSED; state <= SM_STATE_SYMBOLIC; ++state) {
    SmMatrix* m = new_sparse(session(), problem_of({{4, 1, 0}, {1, 9, 2}, {0, 2, 9}}));
    ASSERT_EQ(bring_to(m, state), SM_OK);
    ASSERT_EQ(fn().qxsmsetee(m, 2.0), SM_OK);
    EXPECT_EQ(m->state, state);
    expect_void(m);
  }
}

TEST_P(ChangedValuesTest, an_outer_product_added_to_a_factored_packed_matrix_counts) {
  SmMatrix* m = new_packed(session(), problem_of({{4, 2}, {2, 5}}), SM_FORMAT_COLUMNS);
  ASSERT_EQ(fn().qxsmfact(m, 0), SM_OK);
  const std::vector<double> z{1.0, -1.0};
  ASSERT_EQ(fn().qxsmzscp(m, z.data(), nullptr, 2, 2.0), SM_OK);  // now [6 0; 0 7]
  EXPECT_EQ(m->state, SM_STATE_CLOSED);
  EXPECT_EQ(m->dense_factor, nullptr);
  EXPECT_TRUE(near(solve(m, {6.0, 14.0}), {1.0, 2.0}, 1e-15));
}

TEST_P(ChangedValuesTest, resizing_drops_the_factor) {
  SmMatrix* sparse = new_sparse(session(), problem_of({{4, 2}, {2, 5}}));
  ASSERT_EQ(fn().qxsmfact(sparse, 0), SM_OK);
  ASSERT_EQ(fn().qxsmresize(sparse, 2, 2), SM_OK);
  EXPECT_EQ(sparse->state, SM_STATE_OPEN);
  EXPECT_EQ(sparse->perm, nullptr);
  EXPECT_EQ(sparse->work, nullptr);
  EXPECT_EQ(sparse->work_capacity, 0);
  ASSERT_EQ(fn().qxsmassign(sparse, 0, 0, 0, 2.0), SM_OK);
  ASSERT_EQ(fn().qxsmassign(sparse, 1, 1, 0, 4.0), SM_OK);
  ASSERT_EQ(fn().qxsmclose(sparse, 0.0), SM_OK);
  EXPECT_EQ(solve(sparse, {2.0, 8.0}), (std::vector<double>{1.0, 2.0}));

  SmMatrix* dense = new_packed(session(), problem_of({{4, 2}, {2, 5}}), SM_FORMAT_ROWS);
  ASSERT_EQ(fn().qxsmfact(dense, 0), SM_OK);
  ASSERT_EQ(fn().qxsmresize(dense, 2, 2), SM_OK);
  EXPECT_EQ(dense->state, SM_STATE_CLOSED);
  EXPECT_EQ(dense->dense_factor, nullptr);
  std::int64_t rank = 5;
  EXPECT_EQ(fn().qxsmrank(dense, &rank), SM_OK);
  EXPECT_EQ(rank, 0);
}

TEST_P(ChangedValuesTest, a_refused_size_takes_the_state_to_1_with_the_rows_as_they_were_closed) {
  Random random(12);
  const Problem problem = positive_definite(random_graph(random, 12, 40), random);
  for (std::int32_t state = SM_STATE_CLOSED; state <= SM_STATE_FACTORED; ++state) {
    SmMatrix* m = new_sparse(session(), problem);
    const StoredRows rows = rows_of(m);
    ASSERT_EQ(bring_to(m, state), SM_OK);
    EXPECT_EQ(fn().qxsmresize(m, 12, 11), SM_NOT_SQUARE);
    EXPECT_EQ(m->state, SM_STATE_CLOSED);
    EXPECT_TRUE(rows_of(m) == rows) << "from state " << state;
    const std::vector<double> b = random.vector(12);
    EXPECT_TRUE(near(product(problem.dense(), solve(m, b)), b, 1e-13)) << "from state " << state;
  }
}

TEST_P(ChangedValuesTest, a_refused_size_leaves_no_separate_factor_in_use) {
  for (SmMatrix* m :
       {new_packed(session(), problem_of({{4, 2}, {2, 5}}), SM_FORMAT_COLUMNS),
        new_packed(session(), problem_of({{4, 2}, {2, 5}}), SM_FORMAT_ROWS), new_diagonal(session(), {6.0, 7.0})}) {
    ASSERT_EQ(fn().qxsmfact(m, 0), SM_OK);
    EXPECT_EQ(fn().qxsmresize(m, 2, 3), SM_NOT_SQUARE);
    EXPECT_EQ(m->state, SM_STATE_CLOSED);
    EXPECT_TRUE(near(solve(m, {6.0, 7.0}), {1.0, 1.0}, 1e-15));
  }
}

}  // namespace
}  // namespace sm::test
