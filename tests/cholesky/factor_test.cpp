// qxsmfact's dispatch and checks, the diagonal road, log-determinant and rank.
#include <cmath>
#include <cstring>

#include "cholesky/cholesky_support.hpp"

namespace sm::test {
namespace {

class FactorTest : public ModuleTest {
 protected:
  SmStatus factor(SmMatrix* m, std::int32_t in_place = 0) { return fn().qxsmfact(m, in_place); }
  SmMatrix* tied(std::vector<double>& data, std::int64_t n, std::int32_t kind, std::int32_t format) {
    SmMatrix* m = nullptr;
    EXPECT_EQ(fn().qxsmnew(instance(), &m, kind, format), SM_OK);
    EXPECT_EQ(qxsmtie(m, data.data(), n, n, kind, format), SM_OK);
    EXPECT_EQ(m->state, SM_STATE_CLOSED);
    return m;
  }
  SmMatrix* inverted() {
    SmMatrix* m = new_packed(session(), problem_of({{2, 1}, {1, 2}}), SM_FORMAT_ROWS);
    const std::vector<double> b{1.0, 1.0};
    std::vector<double> x(2);
    EXPECT_EQ(fn().qxsmsoldirect(m, b.data(), x.data(), 1), SM_OK);
    EXPECT_EQ(m->state, SM_STATE_INVERTED);
    return m;
  }
};
INSTANTIATE_BOTH_HOSTS(FactorTest);

double minus_ten_thousandth() {
  const std::uint64_t b = UINT64_C(0xBF1A36E2EB1C432D);
  double d = 0.0;
  std::memcpy(&d, &b, sizeof d);
  return d;
}

TEST_P(FactorTest, a_sparse_matrix_is_factored_from_wherever_it_stands) {
  Random random(1);
  const Problem problem = positive_definite(grid(4, 5), random);
  for (std::int32_t state = SM_STATE_CLOSED; state <= SM_STATE_SYMBOLIC; ++state) {
    SmMatrix* m = new_sparse(session(), problem);
    ASSERT_EQ(bring_to(m, state), SM_OK);
    EXPECT_EQ(factor(m), SM_OK);
    EXPECT_EQ(m->state, SM_STATE_FACTORED);
    EXPECT_EQ(m->rank, 20);
    EXPECT_EQ(m->definite, 1);
    EXPECT_NEAR(m->log_det, static_cast<double>(log_determinant(problem.dense())), 1e-10);
    EXPECT_TRUE(near(dense_of_rows(m), problem.dense(), 0.0));
  }
}

TEST_P(FactorTest, in_place_means_nothing_to_a_sparse_matrix) {
  Random random(2);
  const Problem problem = positive_definite(grid(3, 3), random);
  SmMatrix* a = new_sparse(session(), problem);
  SmMatrix* b = new_sparse(session(), problem);
  EXPECT_EQ(factor(a, 0), SM_OK);
  EXPECT_EQ(factor(b, 1), SM_OK);
  EXPECT_TRUE(rows_of(a) == rows_of(b));
  EXPECT_EQ(stored_reciprocals(a), stored_reciprocals(b));
}

TEST_P(FactorTest, a_factored_matrix_is_left_as_it_is) {
  std::vector<double> triangle = packed(problem_of({{2, 1}, {1, 2}}), SM_FORMAT_ROWS);
  std::vector<double> diagonal{4.0, 9.0};
  for (SmMatrix* m :
       {new_sparse(session(), problem_of({{2, 1}, {1, 2}})), tied(triangle, 2, SM_KIND_SYMMETRIC, SM_FORMAT_ROWS),
        tied(diagonal, 2, SM_KIND_DIAGONAL, SM_FORMAT_ROWS)}) {
    ASSERT_EQ(factor(m), SM_OK);
    const std::int64_t blocks = host().live_blocks();
    m->log_det = 77.0;
    EXPECT_EQ(factor(m, 0), SM_OK);
    EXPECT_EQ(factor(m, 1), SM_OK);
    EXPECT_EQ(m->log_det, 77.0);
    EXPECT_EQ(host().live_blocks(), blocks);
  }
  EXPECT_EQ(triangle, packed(problem_of({{2, 1}, {1, 2}}), SM_FORMAT_ROWS));
  EXPECT_EQ(diagonal, (std::vector<double>{4.0, 9.0}));
}

TEST_P(FactorTest, its_checks_come_in_order) {
  std::vector<double> data(9, 1.0);
  SmMatrix* none = new_untyped(session());
  EXPECT_EQ(factor(none), SM_OK);
  EXPECT_EQ(factor(new_sparse(session(), Problem{"empty", 0, {}}, false)), SM_OK);
  EXPECT_EQ(factor(new_general(session(), 0, 0)), SM_OK);
  none->nnz = 1;
  none->state = SM_STATE_FACTORED;
  EXPECT_EQ(factor(none), SM_OK);  // factored before the kind
  none->state = SM_STATE_INVERTED;
  EXPECT_EQ(factor(none), SM_UNTYPED);  // the kind before inverted
  none->state = SM_STATE_OPEN;
  EXPECT_EQ(factor(none), SM_UNTYPED);
  none->nnz = 0;

  SmMatrix* general = new_general(session(), 3, 3);
  general->state = SM_STATE_INVERTED;
  EXPECT_EQ(factor(general), SM_INVERTED);  // inverted before the kinds
  general->state = SM_STATE_CLOSED;
  EXPECT_EQ(factor(general), SM_UNAVAILABLE);
  EXPECT_EQ(factor(new_general(session(), 3, 2)), SM_UNAVAILABLE);
  SmMatrix* open = new_open_tied(session(), data, 3, 3, SM_KIND_GENERAL, SM_FORMAT_ROWS);
  EXPECT_EQ(factor(open), SM_NOT_CLOSED);  // open before the kinds
  EXPECT_EQ(open->state, SM_STATE_OPEN);
  EXPECT_EQ(factor(new_sparse(session(), problem_of({{1.0}}), false)), SM_NOT_CLOSED);
  EXPECT_EQ(factor(inverted()), SM_INVERTED);
  EXPECT_EQ(factor(inverted(), 1), SM_INVERTED);
}

TEST_P(FactorTest, the_first_failing_step_of_a_sparse_matrix_is_the_answer) {
  SmMatrix* negative = new_sparse(session(), problem_of({{4, 1}, {1, -3}}));
  EXPECT_EQ(factor(negative), SM_NOT_DEFINITE);
  EXPECT_EQ(negative->state, SM_STATE_SYMBOLIC);
  EXPECT_EQ(negative->definite, 0);
  EXPECT_EQ(factor(negative), SM_NOT_DEFINITE);  // from the symbolic factor

  SmMatrix* twice = new_sparse(session(), problem_of({{4, 1, 1}, {1, 4, 0}, {1, 0, 4}}));
  twice->col_index[2] = 1;
  EXPECT_EQ(factor(twice), SM_SYMBOLIC_FAILED);
  EXPECT_EQ(twice->state, SM_STATE_REORDERED);

  SmMatrix* large = new_sparse(session(), problem_of({{4, 1}, {1, 3}}));
  large->work_capacity = SM_MAX_ELEMENTS;
  EXPECT_EQ(factor(large), SM_TOO_LARGE);
  EXPECT_EQ(large->state, SM_STATE_CLOSED);
  large->work_capacity = 0;
}

TEST_P(FactorTest, a_diagonal_matrix_becomes_square_roots) {
  for (const std::int32_t format : {SM_FORMAT_COLUMNS, SM_FORMAT_ROWS})
    for (const std::int32_t in_place : {0, 1}) {
      SmMatrix* m = new_diagonal(session(), {4.0, 0.0, 2.25, -0.00005}, format);
      const std::int64_t blocks = host().live_blocks();
      ASSERT_EQ(factor(m, in_place), SM_OK);
      EXPECT_EQ(m->state, SM_STATE_FACTORED);
      EXPECT_EQ(m->rank, 2);
      EXPECT_EQ(m->definite, 1);
      EXPECT_DOUBLE_EQ(m->log_det, std::log(9.0));
      const std::vector<double> roots{2.0, 0.0, 1.5, 0.0};
      if (in_place) {
        EXPECT_EQ(doubles(m->values, 4), roots);
        EXPECT_EQ(m->dense_factor, nullptr);
        EXPECT_EQ(host().live_blocks(), blocks);
      } else {
        ASSERT_NE(m->dense_factor, nullptr);
        EXPECT_EQ(doubles(m->dense_factor, 4), roots);
        EXPECT_EQ(doubles(m->values, 4), (std::vector<double>{4.0, 0.0, 2.25, -0.00005}));
        EXPECT_EQ(host().live_blocks(), blocks + 1);
      }
    }
}

TEST_P(FactorTest, a_diagonal_element_is_held_against_absolute_limits) {
  const double t = instance()->tolerances[2];
  const double limit = minus_ten_thousandth();
  EXPECT_EQ(limit, -0.0001);
  SmMatrix* m =
      new_diagonal(session(), {t, std::nextafter(t, 1.0), std::nextafter(t, 0.0), limit, std::nan(""), 1e300});
  ASSERT_EQ(factor(m), SM_OK);
  EXPECT_EQ(doubles(m->dense_factor, 6),
            (std::vector<double>{0.0, std::sqrt(std::nextafter(t, 1.0)), 0.0, 0.0, 0.0, std::sqrt(1e300)}));
  EXPECT_EQ(m->rank, 2);
  for (const double bad : {std::nextafter(limit, -1.0), -0.001, -HUGE_VAL}) {
    SmMatrix* n = new_diagonal(session(), {1.0, bad});
    EXPECT_EQ(factor(n), SM_NOT_DEFINITE) << bad;
    EXPECT_EQ(n->definite, 0);
    EXPECT_EQ(n->state, SM_STATE_CLOSED);
  }
  instance()->tolerances[2] = 0.5;
  SmMatrix* coarse = new_diagonal(session(), {0.5, 0.5625, 100.0});
  ASSERT_EQ(factor(coarse), SM_OK);
  EXPECT_EQ(coarse->rank, 2);
}

TEST_P(FactorTest, a_negative_diagonal_element_ends_it_with_the_elements_before_transformed) {
  SmMatrix* apart = new_diagonal(session(), {4.0, -1.0, 9.0});
  EXPECT_EQ(factor(apart, 0), SM_NOT_DEFINITE);
  EXPECT_EQ(doubles(apart->values, 3), (std::vector<double>{4.0, -1.0, 9.0}));
  SmMatrix* in_place = new_diagonal(session(), {4.0, -1.0, 9.0});
  EXPECT_EQ(factor(in_place, 1), SM_NOT_DEFINITE);
  EXPECT_EQ(doubles(in_place->values, 3), (std::vector<double>{2.0, -1.0, 9.0}));
  EXPECT_EQ(in_place->state, SM_STATE_CLOSED);
}

TEST_P(FactorTest, a_separate_diagonal_that_failed_is_filled_again_or_given_back) {
  std::vector<double> data{4.0, -1.0, 9.0};
  SmMatrix* m = tied(data, 3, SM_KIND_DIAGONAL, SM_FORMAT_ROWS);
  const std::int64_t blocks = host().live_blocks();
  EXPECT_EQ(factor(m, 0), SM_NOT_DEFINITE);
  EXPECT_EQ(host().live_blocks(), blocks + owned_blocks(m));
  data[0] = 16.0;
  data[1] = 1.0;
  data[2] = 25.0;
  EXPECT_EQ(factor(m, 0), SM_OK);
  EXPECT_EQ(doubles(m->dense_factor, 3), (std::vector<double>{4.0, 1.0, 5.0}));
  EXPECT_EQ(m->rank, 3);  // counted anew
  EXPECT_EQ(m->definite, 1);
  EXPECT_DOUBLE_EQ(m->log_det, std::log(400.0));
  EXPECT_EQ(host().live_blocks(), blocks + 1);

  std::vector<double> other{4.0, -1.0, 9.0};
  SmMatrix* p = tied(other, 3, SM_KIND_DIAGONAL, SM_FORMAT_ROWS);
  const std::int64_t before = host().live_blocks();
  EXPECT_EQ(factor(p, 0), SM_NOT_DEFINITE);
  other[1] = 1.0;
  EXPECT_EQ(factor(p, 1), SM_OK);
  EXPECT_EQ(p->dense_factor, nullptr);
  EXPECT_EQ(host().live_blocks(), before);
  EXPECT_EQ(other, (std::vector<double>{2.0, 1.0, 3.0}));
}

TEST_P(FactorTest, only_the_low_sixteen_bits_of_in_place_count) {
  for (const std::int32_t apart : {0x10000, 0x7FFF0000, static_cast<std::int32_t>(0xFFFF0000U)}) {
    SmMatrix* m = new_diagonal(session(), {4.0});
    ASSERT_EQ(factor(m, apart), SM_OK);
    EXPECT_NE(m->dense_factor, nullptr) << apart;
    EXPECT_EQ(m->values[0], 4.0);
    SmMatrix* d = new_packed(session(), problem_of({{4.0}}), SM_FORMAT_ROWS);
    ASSERT_EQ(factor(d, apart), SM_OK);
    EXPECT_NE(d->dense_factor, nullptr) << apart;
    EXPECT_EQ(d->values[0], 4.0);
  }
  for (const std::int32_t in_place : {1, 2, 0x8000, -1, 0x10001}) {
    SmMatrix* m = new_diagonal(session(), {4.0});
    ASSERT_EQ(factor(m, in_place), SM_OK);
    EXPECT_EQ(m->dense_factor, nullptr) << in_place;
    EXPECT_EQ(m->values[0], 2.0);
    SmMatrix* d = new_packed(session(), problem_of({{4.0}}), SM_FORMAT_ROWS);
    ASSERT_EQ(factor(d, in_place), SM_OK);
    EXPECT_EQ(d->dense_factor, nullptr) << in_place;
    EXPECT_EQ(d->values[0], 2.0);
  }
}

TEST_P(FactorTest, log_determinant_and_rank_factor_when_needed) {
  const Problem problem = problem_of({{4, 2, 0}, {2, 5, 1}, {0, 1, 8}});
  const auto want = static_cast<double>(log_determinant(problem.dense()));
  for (SmMatrix* m : {new_sparse(session(), problem), new_packed(session(), problem, SM_FORMAT_COLUMNS),
                      new_packed(session(), problem, SM_FORMAT_ROWS)}) {
    double log_det = 0.0;
    std::int64_t rank = 0;
    EXPECT_EQ(fn().qxsmlogdet(m, &log_det), SM_OK);
    EXPECT_NEAR(log_det, want, 1e-12);
    EXPECT_EQ(m->state, SM_STATE_FACTORED);
    EXPECT_EQ(fn().qxsmrank(m, &rank), SM_OK);
    EXPECT_EQ(rank, 3);
  }
  SmMatrix* diagonal = new_diagonal(session(), {2.0, 0.0, 8.0});
  std::int64_t rank = 0;
  EXPECT_EQ(fn().qxsmrank(diagonal, &rank), SM_OK);
  EXPECT_EQ(rank, 2);
  EXPECT_EQ(diagonal->values[2], 8.0);  // the values stay
  double log_det = 0.0;
  EXPECT_EQ(fn().qxsmlogdet(diagonal, &log_det), SM_OK);
  EXPECT_DOUBLE_EQ(log_det, std::log(16.0));
}

TEST_P(FactorTest, log_determinant_and_rank_of_an_inverted_matrix_are_those_found_on_the_way) {
  SmMatrix* m = inverted();
  double log_det = 0.0;
  std::int64_t rank = 0;
  EXPECT_EQ(fn().qxsmlogdet(m, &log_det), SM_OK);
  EXPECT_NEAR(log_det, std::log(3.0), 1e-14);
  EXPECT_EQ(fn().qxsmrank(m, &rank), SM_OK);
  EXPECT_EQ(rank, 2);
}

TEST_P(FactorTest, the_log_determinant_is_missing_on_every_answer_but_0_and_its_checks_come_in_order) {
  std::vector<double> data(9, 1.0);
  const auto expect = [&](SmMatrix* m, SmStatus want) {
    double out = 5.0;
    EXPECT_EQ(fn().qxsmlogdet(m, &out), want);
    EXPECT_TRUE(is_missing(out)) << want;
  };
  SmMatrix* none = new_untyped(session());
  expect(none, SM_NOTHING_TO_REPORT);
  none->nnz = 1;
  expect(none, SM_NOTHING_TO_REPORT);  // before anything about its state 0
  none->nnz = 0;
  expect(new_sparse(session(), Problem{"empty", 0, {}}, false), SM_NOTHING_TO_REPORT);
  expect(new_general(session(), 0, 0), SM_NOTHING_TO_REPORT);
  expect(new_open_tied(session(), data, 3, 2, SM_KIND_GENERAL, SM_FORMAT_ROWS), SM_NOT_CLOSED);
  expect(new_sparse(session(), problem_of({{1.0}}), false), SM_NOT_CLOSED);
  expect(new_general(session(), 3, 2), SM_NOT_SQUARE);
  expect(new_general(session(), 3, 3), SM_UNAVAILABLE);
  expect(new_sparse(session(), problem_of({{4, 1}, {1, -3}})), SM_NOT_DEFINITE);
  expect(new_packed(session(), problem_of({{4, 1}, {1, -3}}), SM_FORMAT_ROWS), SM_NOT_DEFINITE);
  expect(new_diagonal(session(), {1.0, -1.0}), SM_NOT_DEFINITE);
  SmMatrix* m = new_packed(session(), problem_of({{4.0}}), SM_FORMAT_ROWS);
  host().fail_request(0, true);
  expect(m, SM_NO_MEMORY);
  EXPECT_GT(host().stop_failing(), 0);
}

TEST_P(FactorTest, the_rank_is_0_on_every_answer_but_0_and_its_checks_come_in_order) {
  std::vector<double> data(9, 1.0);
  const auto expect = [&](SmMatrix* m, SmStatus want) {
    std::int64_t out = 5;
    EXPECT_EQ(fn().qxsmrank(m, &out), want);
    EXPECT_EQ(out, 0) << want;
  };
  SmMatrix* none = new_untyped(session());
  expect(none, SM_NOTHING_TO_REPORT);
  none->nnz = 1;
  expect(none, SM_NOTHING_TO_REPORT);
  none->nnz = 0;
  expect(new_sparse(session(), Problem{"empty", 0, {}}, false), SM_NOTHING_TO_REPORT);
  expect(new_open_tied(session(), data, 3, 2, SM_KIND_GENERAL, SM_FORMAT_ROWS), SM_NOT_CLOSED);
  expect(new_general(session(), 3, 2), SM_UNAVAILABLE);
  expect(new_general(session(), 3, 3), SM_UNAVAILABLE);
  expect(new_sparse(session(), problem_of({{4, 1}, {1, -3}})), SM_NOT_DEFINITE);
  expect(new_packed(session(), problem_of({{4, 1}, {1, -3}}), SM_FORMAT_COLUMNS), SM_NOT_DEFINITE);
  expect(new_diagonal(session(), {1.0, -1.0}), SM_NOT_DEFINITE);
}

}  // namespace
}  // namespace sm::test
