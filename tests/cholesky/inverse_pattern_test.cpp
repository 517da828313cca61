// qxsminvpattern: the inverse at the stored positions of a matrix.
#include <cmath>

#include "cholesky/cholesky_support.hpp"

namespace sm::test {
namespace {

constexpr double kUntouched = -777.0;
constexpr std::int32_t kStates[] = {SM_STATE_CLOSED, SM_STATE_ORDERED, SM_STATE_REORDERED, SM_STATE_SYMBOLIC,
                                    SM_STATE_FACTORED};

class InversePatternTest : public ModuleTest {
 protected:
  // nnz values and one behind them, which must be left alone.
  static std::vector<double> pattern_of(SmMatrix* m, SmStatus expected = SM_OK) {
    std::vector<double> values(at(m->nnz) + 1, kUntouched);
    EXPECT_EQ(qxsminvpattern(m, values.data()), expected);
    EXPECT_EQ(values.back(), kUntouched);
    values.pop_back();
    return values;
  }
  static SmStatus refused(SmMatrix* m) {
    std::vector<double> values(16, kUntouched);
    const SmStatus status = qxsminvpattern(m, values.data());
    EXPECT_EQ(values, std::vector<double>(16, kUntouched));
    return status;
  }
};
INSTANTIATE_BOTH_HOSTS(InversePatternTest);

// The entries of a problem are in closing order.
std::vector<double> at_entries(const Problem& problem, const Dense& inverse) {
  std::vector<double> values;
  for (const Entry& e : problem.upper) values.push_back(static_cast<double>(inverse(e.row, e.col)));
  return values;
}

TEST_P(InversePatternTest, answers_in_closing_order_from_every_state) {
  for (std::uint64_t seed = 0; seed < 60; ++seed)
    for (const std::int32_t state : kStates) {
      Random random(seed);
      const Problem problem = positive_definite(any_graph(random, 30), random);
      if (problem.n == 0) continue;
      SmMatrix* m = new_sparse(session(), problem);
      ASSERT_EQ(bring_to(m, state), SM_OK);
      const std::vector<double> want = at_entries(problem, inverse(problem.dense()));
      EXPECT_TRUE(near(pattern_of(m), want, 1e-12)) << "seed " << seed << " state " << state;
      EXPECT_EQ(m->state, SM_STATE_FACTORED);
      EXPECT_TRUE(near(pattern_of(m), want, 1e-12)) << "again";
      ASSERT_EQ(fn().qxsmDestroyMatrix(instance(), &m), SM_OK);
    }
}

TEST_P(InversePatternTest, gives_zeros_for_rows_and_columns_of_dropped_pivots) {
  for (std::uint64_t seed = 0; seed < 40; ++seed) {
    Random random(seed);
    const Semidefinite s = cross_product(random, 2 + random.below(12), 1 + random.below(8), random.below(4));
    SmMatrix* m = new_sparse(session(), s.problem);
    ASSERT_EQ(fn().qxsmfact(m, 0), SM_OK);
    ASSERT_EQ(m->rank, s.rank);
    EXPECT_TRUE(near(pattern_of(m), at_entries(s.problem, solved_identity(m)), 1e-9)) << "seed " << seed;
  }
}

TEST_P(InversePatternTest, follows_new_values_and_another_ordering) {
  Random random(3);
  Problem problem = positive_definite(grid(6, 5), random);
  SmMatrix* m = new_sparse(session(), problem);
  const std::vector<double> first = pattern_of(m);
  EXPECT_TRUE(near(first, at_entries(problem, inverse(problem.dense())), 1e-12));
  std::vector<double> values;
  for (Entry& e : problem.upper) values.push_back(e.value = e.row == e.col ? 2.0 * e.value : e.value);
  ASSERT_EQ(qxsmrefill(m, values.data()), SM_OK);
  const std::vector<double> want = at_entries(problem, inverse(problem.dense()));
  EXPECT_TRUE(near(pattern_of(m), want, 1e-12));
  EXPECT_FALSE(near(first, want, 1e-12));
  for (int round = 0; round < 3; ++round) {
    SmMatrix* other = new_sparse(session(), problem);
    ASSERT_EQ(qxsmorder(other, random.permutation(problem.n).data()), SM_OK);
    EXPECT_TRUE(near(pattern_of(other), want, 1e-12));
  }
}

TEST_P(InversePatternTest, its_diagonal_is_that_of_the_inverse) {
  Random random(4);
  const Problem problem = positive_definite(grid(12, 11), random);
  SmMatrix* m = new_sparse(session(), problem);
  const std::vector<double> z = pattern_of(m);
  std::vector<double> diagonal(at(problem.n));
  ASSERT_EQ(fn().qxsminvdiag(m, diagonal.data()), SM_OK);
  for (std::size_t p = 0; p < problem.upper.size(); ++p) {
    const Entry& e = problem.upper[p];
    if (e.row == e.col) {
      EXPECT_EQ(z[p], diagonal[at(e.row)]);
    }
  }
}

TEST_P(InversePatternTest, refuses_any_array_that_overlaps_its_own_values) {
  Random random(6);
  const Problem problem = positive_definite(grid(3, 3), random);
  const std::vector<double> want = at_entries(problem, inverse(problem.dense()));
  for (const std::int32_t state : kStates) {
    SmMatrix* m = new_sparse(session(), problem);
    ASSERT_EQ(bring_to(m, state), SM_OK);
    const std::size_t nnz = at(m->nnz);
    OwnValuesInRoom moved(m);
    const std::vector<double> before = moved.room();
    for (std::size_t first = 1; first < 2 * nnz; ++first) {
      EXPECT_EQ(qxsminvpattern(m, moved.at(first)), SM_BAD_ARGUMENT) << "state " << state << " at " << first;
      EXPECT_EQ(moved.room(), before);
      EXPECT_EQ(m->state, state) << "refused before it factors";
    }
    for (const std::size_t first : {std::size_t{0}, 2 * nnz}) {
      ASSERT_EQ(qxsminvpattern(m, moved.at(first)), SM_OK) << "a neighbour is no part of it";
      EXPECT_TRUE(near(std::vector<double>(moved.at(first), moved.at(first) + nnz), want, 1e-12));
    }
  }
}

TEST_P(InversePatternTest, its_checks_come_in_order) {
  EXPECT_EQ(refused(new_untyped(session())), SM_OK);
  EXPECT_EQ(refused(new_sparse(session(), Problem{"empty", 0, {}}, false)), SM_OK);  // empty before open
  SmMatrix* none = new_untyped(session());
  none->nnz = 1;
  EXPECT_EQ(refused(none), SM_UNTYPED);  // the kind before the state
  none->nnz = 0;
  std::vector<double> data(6, 1.0);
  EXPECT_EQ(refused(new_open_tied(session(), data, 2, 3, SM_KIND_GENERAL, SM_FORMAT_ROWS)), SM_NOT_CLOSED);
  EXPECT_EQ(refused(new_sparse(session(), problem_of({{1.0}}), false)), SM_NOT_CLOSED);
  EXPECT_EQ(refused(new_general(session(), 2, 3)), SM_NOT_SQUARE);  // the shape before the kind
  for (SmMatrix* m : {new_general(session(), 3, 3), new_diagonal(session(), {4.0, 9.0}),
                      new_packed(session(), problem_of({{4, 1}, {1, 3}}), SM_FORMAT_ROWS)}) {
    EXPECT_EQ(refused(m), SM_UNAVAILABLE);
    EXPECT_EQ(qxsminvpattern(m, nullptr), SM_UNAVAILABLE);  // the kind before the array
  }
  SmMatrix* indefinite = new_sparse(session(), problem_of({{4, 1}, {1, -3}}));
  EXPECT_EQ(qxsminvpattern(indefinite, nullptr), SM_BAD_ARGUMENT);  // the array before factoring
  EXPECT_EQ(qxsminvpattern(indefinite, indefinite->nz_values), SM_BAD_ARGUMENT);
  EXPECT_EQ(indefinite->state, SM_STATE_CLOSED);
  EXPECT_EQ(refused(indefinite), SM_NOT_DEFINITE);
}

TEST_P(InversePatternTest, every_request_may_be_refused) {
  Random random(5);
  const Problem problem = positive_definite(grid(5, 4), random);
  const std::vector<double> want = at_entries(problem, inverse(problem.dense()));
  for (const std::int32_t state : {SM_STATE_CLOSED, SM_STATE_FACTORED})
    for (const bool for_ever : {false, true}) {
      std::int64_t k = 0;
      for (bool met = true; met; ++k) {
        Session s(GetParam());
        SmMatrix* m = new_sparse(s, problem);
        ASSERT_EQ(bring_to(m, state), SM_OK);
        const std::int64_t loose = s.host().live_blocks() - owned_blocks(m);
        s.host().fail_request(k, for_ever);
        std::vector<double> values(at(m->nnz), kUntouched);
        const SmStatus status = qxsminvpattern(m, values.data());
        met = s.host().stop_failing() > 0;
        EXPECT_EQ(status, met ? SM_NO_MEMORY : SM_OK) << "request " << k;
        EXPECT_EQ(s.host().live_blocks() - owned_blocks(m), loose) << "request " << k;
        EXPECT_TRUE(near(values, met ? std::vector<double>(values.size(), kUntouched) : want, 1e-12));
        EXPECT_TRUE(near(pattern_of(m), want, 1e-12)) << "after request " << k;
        EXPECT_EQ(s.host().violations(), 0);
      }
      EXPECT_GE(k - 1, 6) << "places, their scratch, four for the inverse";
    }
}

}  // namespace
}  // namespace sm::test
