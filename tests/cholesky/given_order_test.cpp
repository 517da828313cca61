// qxsmorder: an ordering of the caller's in place of the computed one.
#include <algorithm>
#include <cmath>

#include "cholesky/cholesky_support.hpp"

namespace sm::test {
namespace {

class GivenOrderTest : public ModuleTest {
 protected:
  SmMatrix* matrix(Random& random, std::int64_t n) {
    return new_sparse(session(), positive_definite(random_graph(random, n, 30), random));
  }
};
INSTANTIATE_BOTH_HOSTS(GivenOrderTest);

TEST_P(GivenOrderTest, takes_any_permutation_with_the_workspace_of_a_computed_one) {
  for (std::uint64_t seed = 0; seed < 200; ++seed) {
    Random random(seed);
    const Problem problem = positive_definite(any_graph(random, 30), random);
    if (problem.n == 0) continue;
    SmMatrix* m = new_sparse(session(), problem);
    const Indices perm = random.permutation(problem.n);
    ASSERT_EQ(qxsmorder(m, perm.data()), SM_OK) << "seed " << seed;
    EXPECT_EQ(m->state, SM_STATE_ORDERED);
    EXPECT_EQ(words(m->perm, m->rows), perm);
    for (std::int64_t k = 0; k < problem.n; ++k) EXPECT_EQ(m->inv_perm[perm[at(k)]], k);
    EXPECT_EQ(m->work_capacity, 4 * m->rows + 5 * m->nnz);
    ASSERT_NE(m->work, nullptr);
    ASSERT_EQ(fn().qxsmfact(m, 0), SM_OK);
    EXPECT_EQ(m->rank, problem.n);
    EXPECT_EQ(words(m->perm, m->rows), perm) << "the factor is in the given order";
    const Dense unit = product(problem.dense(), solved_identity(m));
    EXPECT_TRUE(near(unit, identity(problem.n), 1e-11)) << "seed " << seed;
  }
}

TEST_P(GivenOrderTest, does_nothing_to_an_empty_matrix_and_to_an_ordered_one) {
  SmMatrix* empty = nullptr;
  ASSERT_EQ(fn().qxsmnewss(instance(), &empty, 0), SM_OK);
  EXPECT_EQ(qxsmorder(empty, nullptr), SM_OK);
  EXPECT_EQ(empty->state, SM_STATE_OPEN);
  Random random(1);
  for (const std::int32_t state : {SM_STATE_ORDERED, SM_STATE_REORDERED, SM_STATE_SYMBOLIC, SM_STATE_FACTORED}) {
    SmMatrix* m = matrix(random, 8);
    ASSERT_EQ(bring_to(m, state), SM_OK);
    const Indices before = words(m->perm, 8);
    const Indices reversed(before.rbegin(), before.rend());
    EXPECT_EQ(qxsmorder(m, reversed.data()), SM_OK);
    EXPECT_EQ(qxsmorder(m, nullptr), SM_OK) << "no permutation is wanted";
    EXPECT_EQ(words(m->perm, 8), before);
    EXPECT_EQ(m->state, state);
  }
}

TEST_P(GivenOrderTest, answers_its_refusals_in_order) {
  Random random(2);
  EXPECT_EQ(qxsmorder(new_diagonal(session(), {1.0, 2.0}), nullptr), SM_NOT_SYMMETRIC_SPARSE);
  const Problem problem = positive_definite(path(4), random);
  for (const std::int32_t format : {SM_FORMAT_COLUMNS, SM_FORMAT_ROWS}) {
    EXPECT_EQ(qxsmorder(new_packed(session(), problem, format), nullptr), SM_NOT_SYMMETRIC_SPARSE);
  }
  std::vector<double> data(4, 1.0);
  SmMatrix* open_general = new_open_tied(session(), data, 2, 2, SM_KIND_GENERAL, SM_FORMAT_ROWS);
  EXPECT_EQ(qxsmorder(open_general, nullptr), SM_NOT_SYMMETRIC_SPARSE) << "112 comes before 102";
  SmMatrix* untyped = new_open_tied(session(), data, 2, 2, SM_KIND_GENERAL, SM_FORMAT_ROWS);
  untyped->kind = SM_KIND_NONE;
  EXPECT_EQ(qxsmorder(untyped, nullptr), SM_UNTYPED) << "1 comes before 112";
  SmMatrix* open = new_sparse(session(), problem, false);
  EXPECT_EQ(qxsmorder(open, nullptr), SM_WRONG_STATE) << "102 comes before 104";
}

TEST_P(GivenOrderTest, refuses_what_is_no_permutation_and_keeps_the_matrix_closed) {
  Random random(3);
  SmMatrix* m = matrix(random, 4);
  const std::int64_t blocks = host().live_blocks();
  EXPECT_EQ(qxsmorder(m, nullptr), SM_BAD_ARGUMENT);
  for (const Indices& bad : {Indices{0, 1, 2, 4}, Indices{0, -1, 2, 3}, Indices{0, 1, 2, 2}, Indices{3, 2, 3, 0},
                             Indices{0, 1, 2, INT64_MAX}, Indices{INT64_MIN, 1, 2, 3}}) {
    EXPECT_EQ(qxsmorder(m, bad.data()), SM_BAD_ARGUMENT);
    EXPECT_EQ(m->state, SM_STATE_CLOSED);
    EXPECT_EQ(m->perm, nullptr);
    EXPECT_EQ(host().live_blocks(), blocks);
  }
  const Indices good = {2, 0, 3, 1};
  EXPECT_EQ(qxsmorder(m, good.data()), SM_OK);
}

TEST_P(GivenOrderTest, may_read_the_permutation_that_the_record_holds) {
  Random random(4);
  SmMatrix* m = matrix(random, 6);
  ASSERT_EQ(bring_to(m, SM_STATE_REORDERED), SM_OK);
  const Indices before = words(m->perm, 6);
  EXPECT_EQ(fn().qxsmresize(m, 2, 3), SM_NOT_SQUARE) << "leaves a closed matrix with its permutations";
  ASSERT_EQ(m->state, SM_STATE_CLOSED);
  ASSERT_NE(m->perm, nullptr);
  ASSERT_EQ(qxsmorder(m, m->perm), SM_OK);
  EXPECT_EQ(words(m->perm, 6), before);
  EXPECT_EQ(fn().qxsmfact(m, 0), SM_OK);
}

TEST_P(GivenOrderTest, survives_every_refused_request) {
  survives_every_allocation_failure(
      GetParam(),
      [](Session& session) {
        Random random(5);
        return new_sparse(session, positive_definite(random_graph(random, 9, 40), random));
      },
      [](Session&, SmMatrix* m) {
        const Indices perm = {8, 6, 4, 2, 0, 1, 3, 5, 7};
        const SmStatus status = qxsmorder(m, perm.data());
        EXPECT_EQ(m->state, status == SM_OK ? SM_STATE_ORDERED : SM_STATE_CLOSED);
        return status;
      });
}

}  // namespace
}  // namespace sm::test
