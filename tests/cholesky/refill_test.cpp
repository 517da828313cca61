// qxsmrefill: new values for the pattern that is there.
#include <cmath>
#include <limits>

#include "cholesky/cholesky_support.hpp"

namespace sm::test {
namespace {

class RefillTest : public ModuleTest {};
INSTANTIATE_BOTH_HOSTS(RefillTest);

constexpr std::int32_t kStates[] = {SM_STATE_CLOSED, SM_STATE_ORDERED, SM_STATE_REORDERED, SM_STATE_SYMBOLIC,
                                    SM_STATE_FACTORED};

// Another positive definite problem on the pattern of `problem`: everything times a factor, the diagonal more.
Problem changed(const Problem& problem, Random& random) {
  Problem next = problem;
  const double factor = 1.0 + static_cast<double>(random.below(64)) / 64.0;
  for (Entry& e : next.upper) e.value = e.row == e.col ? 2.0 * factor * e.value + 1.0 : factor * e.value;
  return next;
}

// The values of a problem are by row and then by column: closing order.
std::vector<double> values_of(const Problem& problem) {
  std::vector<double> v;
  for (const Entry& e : problem.upper) v.push_back(e.value);
  return v;
}

TEST_P(RefillTest, puts_each_value_where_its_entry_is_in_every_state) {
  for (std::uint64_t seed = 0; seed < 150; ++seed) {
    for (const std::int32_t state : kStates) {
      Random random(seed);
      Problem problem = positive_definite(any_graph(random, 25), random);
      if (problem.n == 0) continue;
      SmMatrix* m = new_sparse(session(), problem);
      ASSERT_EQ(bring_to(m, state), SM_OK);
      for (int round = 0; round < 3; ++round) {
        problem = changed(problem, random);
        const std::vector<double> values = values_of(problem);
        ASSERT_EQ(static_cast<std::int64_t>(values.size()), m->nnz);
        const std::int32_t before = m->state;
        ASSERT_EQ(qxsmrefill(m, values.data()), SM_OK) << "seed " << seed << " state " << state;
        EXPECT_EQ(m->state, before == SM_STATE_FACTORED ? SM_STATE_SYMBOLIC : before);
        EXPECT_TRUE(near(dense_of_rows(m), problem.dense(), 0.0)) << "seed " << seed << " state " << state;
        EXPECT_EQ(m->rank, 0);
        EXPECT_TRUE(is_missing(m->log_det));
        EXPECT_EQ(m->definite, -1);
        if (round == 1) {
          ASSERT_EQ(fn().qxsmfact(m, 0), SM_OK);
        }
      }
      ASSERT_EQ(fn().qxsmfact(m, 0), SM_OK);
      EXPECT_TRUE(near(product(problem.dense(), solved_identity(m)), identity(problem.n), 1e-10)) << "seed " << seed;
      ASSERT_EQ(fn().qxsmDestroyMatrix(instance(), &m), SM_OK);
    }
  }
}

TEST_P(RefillTest, asks_for_memory_once_for_a_pattern) {
  Random random(7);
  const Problem problem = positive_definite(grid(5, 4), random);
  const std::vector<double> values = values_of(problem);
  for (const std::int32_t state : kStates) {
    SmMatrix* m = new_sparse(session(), problem);
    ASSERT_EQ(bring_to(m, state), SM_OK);
    host().fail_request(0, true);
    EXPECT_EQ(qxsmrefill(m, values.data()), state < SM_STATE_REORDERED ? SM_OK : SM_NO_MEMORY) << "state " << state;
    host().stop_failing();
    ASSERT_EQ(qxsmrefill(m, values.data()), SM_OK);
    ASSERT_EQ(fn().qxsmfact(m, 0), SM_OK);
    ASSERT_EQ(qxsmrefill(m, values.data()), SM_OK);
    host().fail_request(0, true);
    for (int round = 0; round < 3; ++round) {
      EXPECT_EQ(qxsmrefill(m, values.data()), SM_OK);
      EXPECT_EQ(qxsmnumfact(m), SM_OK) << "nothing but the numbers is left to do";
    }
    EXPECT_EQ(host().stop_failing(), 0);
  }
}

TEST_P(RefillTest, changes_nothing_when_memory_is_refused) {
  survives_every_allocation_failure(
      GetParam(),
      [](Session& session) {
        Random random(8);
        SmMatrix* m = new_sparse(session, positive_definite(grid(4, 4), random));
        EXPECT_EQ(bring_to(m, SM_STATE_FACTORED), SM_OK);
        return m;
      },
      [](Session&, SmMatrix* m) {
        const StoredRows before = rows_of(m);
        const double log_det = m->log_det;
        const std::vector<double> values(at(m->nnz), 0.5);
        const SmStatus status = qxsmrefill(m, values.data());
        if (status != SM_OK) {
          EXPECT_EQ(rows_of(m), before);
          EXPECT_EQ(m->state, SM_STATE_FACTORED);
          EXPECT_EQ(m->log_det, log_det);
        }
        return status;
      });
}

TEST_P(RefillTest, finds_the_places_again_after_another_ordering) {
  Random random(9);
  const Problem problem = positive_definite(random_graph(random, 12, 40), random);
  const std::vector<double> values = values_of(problem);
  SmMatrix* m = new_sparse(session(), problem);
  ASSERT_EQ(fn().qxsmfact(m, 0), SM_OK);
  ASSERT_EQ(qxsmrefill(m, values.data()), SM_OK);
  for (int round = 0; round < 4; ++round) {
    ASSERT_EQ(fn().qxsmresize(m, 1, 2), SM_NOT_SQUARE) << "which puts the rows back into the caller's order";
    ASSERT_EQ(qxsmrefill(m, values.data()), SM_OK);
    EXPECT_TRUE(near(dense_of_rows(m), problem.dense(), 0.0));
    const Indices perm = random.permutation(problem.n);
    ASSERT_EQ(qxsmorder(m, perm.data()), SM_OK);
    ASSERT_EQ(qxsmreorder(m), SM_OK);
    ASSERT_EQ(qxsmrefill(m, values.data()), SM_OK);
    EXPECT_TRUE(near(dense_of_rows(m), problem.dense(), 0.0)) << "round " << round;
  }
}

TEST_P(RefillTest, serves_a_clone_of_a_refilled_matrix) {
  Random random(10);
  const Problem problem = positive_definite(grid(4, 3), random);
  SmMatrix* m = new_sparse(session(), problem);
  ASSERT_EQ(fn().qxsmfact(m, 0), SM_OK);
  ASSERT_EQ(qxsmrefill(m, values_of(problem).data()), SM_OK);
  SmMatrix* copy = make(SM_KIND_SYMMETRIC, SM_FORMAT_SPARSE, 2, 2);
  ASSERT_EQ(qxsmclone(m, copy, 0), SM_OK);
  EXPECT_EQ(copy->factor_reserved, nullptr) << "the copy finds its own places";
  const Problem next = changed(problem, random);
  ASSERT_EQ(qxsmrefill(copy, values_of(next).data()), SM_OK);
  EXPECT_TRUE(near(dense_of_rows(copy), next.dense(), 0.0));
  EXPECT_TRUE(near(dense_of_rows(m), problem.dense(), 0.0));
}

TEST_P(RefillTest, takes_values_of_any_sort) {
  const Problem problem = problem_of({{2.0, 1.0}, {1.0, 2.0}});
  SmMatrix* m = new_sparse(session(), problem);
  ASSERT_EQ(fn().qxsmfact(m, 0), SM_OK);
  const std::vector<double> indefinite = {-5.0, 1.0, -5.0};
  ASSERT_EQ(qxsmrefill(m, indefinite.data()), SM_OK);
  EXPECT_EQ(qxsmnumfact(m), SM_NOT_DEFINITE);
  const std::vector<double> singular = {1.0, 1.0, 1.0};
  ASSERT_EQ(qxsmrefill(m, singular.data()), SM_OK) << "after a refusal too";
  ASSERT_EQ(qxsmnumfact(m), SM_OK);
  EXPECT_EQ(m->rank, 1);
}

// The refused arrays are parts of one in which the matrix's values have room before and behind them, as of a host that
// hands out neighbouring blocks.
TEST_P(RefillTest, refuses_any_array_that_overlaps_its_own_values) {
  Random random(12);
  const Problem problem = positive_definite(grid(3, 3), random);
  for (const std::int32_t state : kStates) {
    SmMatrix* m = new_sparse(session(), problem);
    ASSERT_EQ(bring_to(m, state), SM_OK);
    const std::size_t nnz = at(m->nnz);
    OwnValuesInRoom moved(m);
    const std::vector<double> before = moved.room();
    for (std::size_t first = 1; first < 2 * nnz; ++first) {
      EXPECT_EQ(qxsmrefill(m, moved.at(first)), SM_BAD_ARGUMENT) << "state " << state << " at " << first;
      EXPECT_EQ(moved.room(), before);
      EXPECT_EQ(m->state, state);
    }
    for (const std::size_t first : {std::size_t{0}, 2 * nnz}) {
      EXPECT_EQ(qxsmrefill(m, moved.at(first)), SM_OK) << "a neighbour is no part of it";
    }
  }
}

TEST_P(RefillTest, answers_its_refusals_in_order) {
  Random random(11);
  SmMatrix* empty = nullptr;
  ASSERT_EQ(fn().qxsmnewss(instance(), &empty, 0), SM_OK);
  EXPECT_EQ(qxsmrefill(empty, nullptr), SM_OK);
  const Problem problem = positive_definite(path(4), random);
  EXPECT_EQ(qxsmrefill(new_packed(session(), problem, SM_FORMAT_ROWS), nullptr), SM_NOT_SYMMETRIC_SPARSE);
  std::vector<double> data(4, 1.0);
  SmMatrix* open_general = new_open_tied(session(), data, 2, 2, SM_KIND_GENERAL, SM_FORMAT_ROWS);
  EXPECT_EQ(qxsmrefill(open_general, nullptr), SM_NOT_SYMMETRIC_SPARSE) << "112 comes before 113";
  open_general->kind = SM_KIND_NONE;
  EXPECT_EQ(qxsmrefill(open_general, nullptr), SM_UNTYPED) << "1 comes before 112";
  SmMatrix* open = new_sparse(session(), problem, false);
  EXPECT_EQ(qxsmrefill(open, nullptr), SM_NOT_CLOSED) << "113 comes before 104";
  SmMatrix* m = new_sparse(session(), problem);
  EXPECT_EQ(qxsmrefill(m, nullptr), SM_BAD_ARGUMENT);
  EXPECT_EQ(qxsmrefill(m, m->nz_values), SM_BAD_ARGUMENT);
  ASSERT_EQ(bring_to(m, SM_STATE_FACTORED), SM_OK);
  host().fail_request(0, true);
  EXPECT_EQ(qxsmrefill(m, nullptr), SM_BAD_ARGUMENT) << "104 comes before 101";
  EXPECT_EQ(host().stop_failing(), 0);
  EXPECT_EQ(m->state, SM_STATE_FACTORED);
}

}  // namespace
}  // namespace sm::test
