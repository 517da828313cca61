// The factor's workspace at its edges, and what a refused resize leaves of an ordered matrix.
#include "cholesky/cholesky_support.hpp"

namespace sm::test {
namespace {

class WorkspaceTest : public ModuleTest {};
INSTANTIATE_BOTH_HOSTS(WorkspaceTest);

// Rows that touch every later one, in part: their subscripts cannot be shared.
Problem spread_problem(std::int64_t n) {
  std::vector<std::vector<double>> a(at(n), std::vector<double>(at(n), 0.0));
  for (std::int64_t i = 0; i < n; ++i) {
    a[at(i)][at(i)] = 64.0;
    for (std::int64_t j = i + 1; j < n; ++j) {
      if ((i + j) % 3 == 0) a[at(i)][at(j)] = a[at(j)][at(i)] = -1.0;
    }
  }
  return problem_of(a);
}

TEST_P(WorkspaceTest, refused_memory_for_the_ordering_leaves_no_workspace_and_the_first_size_for_the_next_attempt) {
  SmMatrix* m = new_sparse(session(), spread_problem(9));
  // Two permutation arrays, then the workspace.
  host().fail_request(2, false);
  EXPECT_EQ(qxsmmd(m), SM_NO_MEMORY);
  EXPECT_EQ(host().stop_failing(), 1);
  EXPECT_EQ(m->work, nullptr);
  EXPECT_EQ(m->work_capacity, 0);
  ASSERT_EQ(qxsmmd(m), SM_OK);
  EXPECT_EQ(m->work_capacity, 4 * m->rows + 5 * m->nnz);
}

TEST_P(WorkspaceTest, subscripts_that_just_fit_do_not_restart_and_one_slot_less_does) {
  SmMatrix* probe = new_sparse(session(), spread_problem(14));
  ASSERT_EQ(bring_to(probe, SM_STATE_SYMBOLIC), SM_OK);
  const std::int64_t n = probe->rows;
  const std::int64_t slots = probe->factor_iju[n - 1] + 1;
  ASSERT_GT(slots, 1);
  for (const std::int64_t missing : {0, 1}) {
    SmMatrix* m = new_sparse(session(), spread_problem(14));
    ASSERT_EQ(bring_to(m, SM_STATE_REORDERED), SM_OK);
    replace_work(m, 5 * n + 1 + slots - missing);
    // Room for the values is one request; a restart would be one before it.
    host().fail_request(1, false);
    EXPECT_EQ(qxsmsymbfact(m), missing ? SM_NO_MEMORY : SM_OK) << missing << " slots missing";
    EXPECT_EQ(host().stop_failing(), missing);
    ASSERT_EQ(qxsmsymbfact(m), SM_OK);
    EXPECT_EQ(stored_structure(m), stored_structure(probe));
  }
}

TEST_P(WorkspaceTest, a_refused_resize_puts_reordered_rows_back_into_the_callers_order) {
  const Problem problem = spread_problem(13);
  for (const std::int32_t state : {SM_STATE_ORDERED, SM_STATE_REORDERED, SM_STATE_SYMBOLIC, SM_STATE_FACTORED}) {
    SmMatrix* m = new_sparse(session(), problem);
    const StoredRows before = rows_of(m);
    ASSERT_EQ(bring_to(m, state), SM_OK);
    EXPECT_EQ(fn().qxsmresize(m, 3, 4), SM_NOT_SQUARE);
    EXPECT_EQ(m->state, SM_STATE_CLOSED);
    EXPECT_TRUE(rows_of(m) == before) << "from state " << state;
    double value = 0.0;
    EXPECT_EQ(fn().qxsmget(m, 0, 3, &value), SM_OK);
    EXPECT_EQ(value, -1.0);
    double log_det = 0.0;
    EXPECT_EQ(fn().qxsmlogdet(m, &log_det), SM_OK);
    SmMatrix* fresh = new_sparse(session(), problem);
    double want = 0.0;
    EXPECT_EQ(fn().qxsmlogdet(fresh, &want), SM_OK);
    EXPECT_EQ(log_det, want);
  }
}

// Two requests: the separate array, and the copy that the inversion works in.
TEST_P(WorkspaceTest, a_separate_array_taken_for_nothing_goes_back) {
  for (const std::int32_t format : {SM_FORMAT_COLUMNS, SM_FORMAT_ROWS}) {
    SmMatrix* m = new_packed(session(), spread_problem(5), format);
    const std::int64_t blocks = host().live_blocks();
    host().fail_request(1, false);
    EXPECT_EQ(fn().qxsmfact(m, 0), SM_NO_MEMORY);
    EXPECT_EQ(host().stop_failing(), 1);
    EXPECT_EQ(host().live_blocks(), blocks);
    EXPECT_EQ(m->dense_factor, nullptr);
    EXPECT_EQ(fn().qxsmfact(m, 0), SM_OK);
  }
}

TEST_P(WorkspaceTest, a_refused_diagonal_leaves_the_solution_alone) {
  SmMatrix* m = new_diagonal(session(), {2.0, -1.0, 2.0});
  const std::vector<double> b = {2.0, 2.0, 2.0};
  std::vector<double> x = {7.0, 7.0, 7.0};
  EXPECT_EQ(fn().qxsmsoldirect(m, b.data(), x.data(), 1), SM_NOT_DEFINITE);
  EXPECT_EQ(m->definite, 0);
  EXPECT_EQ(x, (std::vector<double>{7.0, 7.0, 7.0}));
  EXPECT_EQ(fn().qxsmsoldirect(m, b.data(), x.data(), 0), SM_OK);
  EXPECT_EQ(m->definite, 1);
}

}  // namespace
}  // namespace sm::test
