#include <cmath>

#include "cholesky/cholesky_support.hpp"

namespace sm::test {
namespace {

class ReorderTest : public OrderedTest {};
INSTANTIATE_BOTH_HOSTS(ReorderTest);

TEST_P(ReorderTest, moves_every_entry_to_the_row_of_the_index_that_comes_first) {
  for (std::uint64_t seed = 0; seed < 800; ++seed) {
    Random random(seed);
    const Problem problem = positive_definite(any_graph(random, 40), random);
    if (problem.n == 0) continue;
    SmMatrix* m = ordered(problem);
    if (random.chance(50)) impose_order(m, random.permutation(problem.n));
    if (random.chance(50)) replace_work(m, problem.n + m->nnz);  // no room but for the targets
    const StoredRows want = reordered_rows(m);
    ASSERT_EQ(qxsmreorder(m), SM_OK);
    EXPECT_EQ(m->state, SM_STATE_REORDERED);
    const StoredRows got = rows_of(m);
    EXPECT_EQ(got.row_start, want.row_start) << "seed " << seed;
    EXPECT_EQ(got.col_index, want.col_index) << "seed " << seed;
    EXPECT_EQ(got.value_bits, want.value_bits) << "seed " << seed;
    EXPECT_TRUE(near(dense_of_rows(m), problem.dense(), 0.0)) << "seed " << seed;
    destroy(m);
  }
}

TEST_P(ReorderTest, every_row_begins_with_its_diagonal_and_holds_later_indices_only) {
  Random random(5);
  SmMatrix* m = ordered(positive_definite(grid(6, 7), random));
  ASSERT_EQ(qxsmreorder(m), SM_OK);
  for (std::int64_t i = 0; i < m->rows; ++i) {
    ASSERT_LT(m->row_start[i], m->row_start[i + 1]);
    EXPECT_EQ(m->col_index[m->row_start[i]], i);
    for (std::int64_t p = m->row_start[i] + 1; p < m->row_start[i + 1]; ++p)
      EXPECT_GT(m->inv_perm[m->col_index[p]], m->inv_perm[i]);
  }
}

TEST_P(ReorderTest, keeps_the_order_and_the_permutation_arrays_it_is_given) {
  Random random(6);
  SmMatrix* m = ordered(positive_definite(grid(3, 4), random));
  const Indices perm = words(m->perm, 12);
  const Indices inverse = words(m->inv_perm, 12);
  const std::int64_t blocks = host().live_blocks();
  host().fail_request(0, true);
  EXPECT_EQ(qxsmreorder(m), SM_OK);
  EXPECT_EQ(host().stop_failing(), 0);  // nothing was asked for
  EXPECT_EQ(host().live_blocks(), blocks);
  EXPECT_EQ(words(m->perm, 12), perm);
  EXPECT_EQ(words(m->inv_perm, 12), inverse);
}

TEST_P(ReorderTest, moves_the_bits_of_a_value_unchanged) {
  Problem p = problem_of({{1, 2, 3}, {0, 4, 5}, {0, 0, 6}});
  p.upper[1].value = std::nan("17");
  p.upper[2].value = -0.0;
  SmMatrix* m = ordered(p);
  impose_order(m, {2, 0, 1});
  ASSERT_EQ(qxsmreorder(m), SM_OK);
  EXPECT_EQ(words(m->row_start, 4), (Indices{0, 2, 3, 6}));
  EXPECT_EQ(words(m->col_index, 6), (Indices{0, 1, 1, 2, 0, 1}));
  EXPECT_EQ(bits(m->nz_values, 6), bits({1.0, std::nan("17"), 4.0, 6.0, -0.0, 5.0}));
}

TEST_P(ReorderTest, of_two_diagonals_in_a_row_the_last_comes_first_and_the_other_stays_in_the_row) {
  SmMatrix* m = ordered(problem_of({{1, 2, 3}, {0, 4, 5}, {0, 0, 6}}));
  impose_order(m, natural_order(3));
  m->col_index[1] = 0;  // row 0: (0, 0), (0, 0), (0, 2)
  ASSERT_EQ(qxsmreorder(m), SM_OK);
  EXPECT_EQ(words(m->row_start, 4), (Indices{0, 3, 5, 6}));
  EXPECT_EQ(words(m->col_index, 6), (Indices{0, 0, 2, 1, 2, 2}));
  EXPECT_EQ(doubles(m->nz_values, 6), (std::vector<double>{2.0, 1.0, 3.0, 4.0, 5.0, 6.0}));
}

TEST_P(ReorderTest, applies_an_ordering_once) {
  Random random(8);
  SmMatrix* m = ordered(positive_definite(grid(4, 4), random));
  ASSERT_EQ(qxsmreorder(m), SM_OK);
  for (const std::int32_t state : {SM_STATE_REORDERED, SM_STATE_SYMBOLIC, SM_STATE_FACTORED}) {
    if (state == SM_STATE_SYMBOLIC) {
      ASSERT_EQ(qxsmsymbfact(m), SM_OK);
    }
    if (state == SM_STATE_FACTORED) {
      ASSERT_EQ(qxsmnumfact(m), SM_OK);
    }
    const StoredRows rows = rows_of(m);
    EXPECT_EQ(qxsmreorder(m), SM_OK);
    EXPECT_EQ(m->state, state);
    EXPECT_TRUE(rows_of(m) == rows);
  }
}

TEST_P(ReorderTest, afterwards_only_the_diagonal_is_served) {
  SmMatrix* m = ordered(problem_of({{1, 2}, {0, 4}}));
  ASSERT_EQ(qxsmreorder(m), SM_OK);
  double value = 0.0;
  EXPECT_EQ(fn().qxsmget(m, 1, 1, &value), SM_OK);
  EXPECT_EQ(value, 4.0);
  EXPECT_EQ(fn().qxsmget(m, 0, 0, &value), SM_OK);
  EXPECT_EQ(value, 1.0);
  EXPECT_EQ(fn().qxsmget(m, 0, 1, &value), SM_NO_ELEMENT);
}

TEST_P(ReorderTest, answers_0_for_an_empty_matrix_in_any_state) {
  for (SmMatrix* m : {new_sparse(session(), Problem{"empty", 0, {}}), new_untyped(session())}) {
    const std::int32_t state = m->state;
    EXPECT_EQ(qxsmreorder(m), SM_OK);
    EXPECT_EQ(m->state, state);
  }
}

TEST_P(ReorderTest, answers_0_from_state_3_on_before_it_looks_at_the_kind) {
  SmMatrix* m = new_untyped(session());
  m->nnz = 1;
  for (const std::int32_t state : {SM_STATE_REORDERED, SM_STATE_FACTORED, SM_STATE_INVERTED}) {
    m->state = state;
    EXPECT_EQ(qxsmreorder(m), SM_OK);
  }
  for (const std::int32_t state : {SM_STATE_OPEN, SM_STATE_CLOSED, SM_STATE_ORDERED}) {
    m->state = state;
    EXPECT_EQ(qxsmreorder(m), SM_UNTYPED);
  }
  m->nnz = 0;
  m->state = SM_STATE_OPEN;
}

TEST_P(ReorderTest, answers_102_without_an_ordering) {
  const Problem problem = problem_of({{2, 1}, {0, 2}});
  SmMatrix* open = new_sparse(session(), problem, false);
  EXPECT_EQ(qxsmreorder(open), SM_WRONG_STATE);
  EXPECT_EQ(open->state, SM_STATE_OPEN);
  SmMatrix* closed = new_sparse(session(), problem);
  const StoredRows rows = rows_of(closed);
  EXPECT_EQ(qxsmreorder(closed), SM_WRONG_STATE);
  EXPECT_EQ(closed->state, SM_STATE_CLOSED);
  EXPECT_TRUE(rows_of(closed) == rows);
}

TEST_P(ReorderTest, answers_102_for_what_is_not_symmetric_sparse) {
  const Problem problem = problem_of({{2, 1}, {0, 2}});
  for (SmMatrix* m : {new_packed(session(), problem, SM_FORMAT_ROWS), new_diagonal(session(), {1.0, 2.0}),
                      new_general(session(), 2, 2)}) {
    EXPECT_EQ(qxsmreorder(m), SM_WRONG_STATE);
    m->state = SM_STATE_ORDERED;
    EXPECT_EQ(qxsmreorder(m), SM_WRONG_STATE);
    m->state = SM_STATE_CLOSED;
  }
}

}  // namespace
}  // namespace sm::test
