// qxsmfact of packed symmetric matrices.
#include <algorithm>
#include <cmath>

#include "cholesky/cholesky_support.hpp"
#include "cholesky/pivot_cases.hpp"

namespace sm::test {
namespace {

constexpr std::int32_t kFormats[] = {SM_FORMAT_COLUMNS, SM_FORMAT_ROWS};

class DenseFactorTest : public ModuleTest {
 protected:
  double tolerance() { return instance()->tolerances[2]; }
  SmStatus factor(SmMatrix* m, std::int32_t in_place) { return fn().qxsmfact(m, in_place); }
  SmMatrix* tied(std::vector<double>& data, std::int64_t n, std::int32_t format) {
    SmMatrix* m = nullptr;
    EXPECT_EQ(fn().qxsmnew(instance(), &m, SM_KIND_SYMMETRIC, format), SM_OK);
    EXPECT_EQ(qxsmtie(m, data.data(), n, n, SM_KIND_SYMMETRIC, format), SM_OK);
    return m;
  }
  void destroy(SmMatrix* m) { EXPECT_EQ(fn().qxsmDestroyMatrix(instance(), &m), SM_OK); }
};
INSTANTIATE_BOTH_HOSTS(DenseFactorTest);

// R with R'R = A: accepted rows are sqrt(d) times the row of U, dropped rows are 0.
void expect_factor(const double* r, const Problem& problem, std::int32_t format, double tolerance) {
  const DenseFactor want = factor_with_drops(problem.dense(), tolerance);
  Dense wanted(problem.n, problem.n);
  for (std::int64_t k = 0; k < problem.n; ++k)
    for (std::int64_t j = k; j < problem.n; ++j) wanted(k, j) = std::sqrt(want.d[at(k)]) * want.u(k, j);
  const Dense got = triangle_of_packed(r, problem.n, format);
  EXPECT_TRUE(near(got, wanted, 1e-11));
  EXPECT_TRUE(near(product(transposed(got), got), problem.dense(), 1e-13));
  for (std::int64_t k = 0; k < problem.n; ++k) {
    if (want.accepted[at(k)]) continue;
    for (std::int64_t j = k; j < problem.n; ++j) EXPECT_EQ(got(k, j), 0.0L) << "row " << k << " is dropped";
  }
}

void expect_results(const SmMatrix* m, const Problem& problem, double tolerance) {
  const DenseFactor want = factor_with_drops(problem.dense(), tolerance);
  EXPECT_EQ(m->state, SM_STATE_FACTORED);
  EXPECT_EQ(m->definite, 1);
  EXPECT_EQ(m->rank, want.rank);
  EXPECT_NEAR(m->log_det, static_cast<double>(want.log_det), 1e-10);
}

TEST_P(DenseFactorTest, gives_a_packed_triangle_with_its_product_the_matrix) {
  for (std::uint64_t seed = 0; seed < 80; ++seed) {
    Random random(seed);
    const std::int64_t n = 1 + random.below(24);
    const Problem problem = positive_definite(random_graph(random, n, 20 + random.below(80)), random);
    for (const std::int32_t format : kFormats)
      for (const std::int32_t in_place : {0, 1}) {
        SmMatrix* m = new_packed(session(), problem, format);
        const std::vector<double> values = doubles(m->values, m->nnz);
        const std::int64_t blocks = host().live_blocks();
        ASSERT_EQ(factor(m, in_place), SM_OK);
        expect_results(m, problem, tolerance());
        EXPECT_EQ(m->rank, n);
        EXPECT_NEAR(m->log_det, static_cast<double>(log_determinant(problem.dense())), 1e-10);
        expect_factor(in_place ? m->values : m->dense_factor, problem, format, tolerance());
        EXPECT_EQ(host().live_blocks(), in_place ? blocks : blocks + 1);
        if (in_place) {
          EXPECT_EQ(m->dense_factor, nullptr);
        } else {
          EXPECT_EQ(doubles(m->values, m->nnz), values);
        }
        destroy(m);
      }
    if (HasFailure()) FAIL() << "seed " << seed;
  }
}

TEST_P(DenseFactorTest, drops_dependent_rows_and_leaves_zeros_there) {
  for (std::uint64_t seed = 0; seed < 60; ++seed) {
    Random random(seed);
    const Semidefinite s = cross_product(random, 1 + random.below(14), random.below(6), random.below(4));
    for (const std::int32_t format : kFormats) {
      SmMatrix* m = new_packed(session(), s.problem, format);
      ASSERT_EQ(factor(m, 1), SM_OK) << "seed " << seed;
      expect_results(m, s.problem, tolerance());
      EXPECT_EQ(m->rank, s.rank);
      expect_factor(m->values, s.problem, format, tolerance());
      destroy(m);
    }
    if (HasFailure()) FAIL() << "seed " << seed;
  }
}

TEST_P(DenseFactorTest, lays_the_triangle_out_as_the_format_does) {
  // R = [2 1 0; 0 2 1; 0 0 3].
  const Problem problem = problem_of({{4, 2, 0}, {2, 5, 2}, {0, 2, 10}});
  SmMatrix* columns_first = new_packed(session(), problem, SM_FORMAT_COLUMNS);
  ASSERT_EQ(factor(columns_first, 1), SM_OK);
  EXPECT_TRUE(near(doubles(columns_first->values, 6), {2.0, 1.0, 2.0, 0.0, 1.0, 3.0}, 1e-15));
  SmMatrix* rows_first = new_packed(session(), problem, SM_FORMAT_ROWS);
  ASSERT_EQ(factor(rows_first, 1), SM_OK);
  EXPECT_TRUE(near(doubles(rows_first->values, 6), {2.0, 1.0, 0.0, 2.0, 1.0, 3.0}, 1e-15));
}

TEST_P(DenseFactorTest, a_dropped_row_is_zero_and_the_column_above_it_is_kept) {
  // Column 1 is twice column 0.
  const Problem problem = problem_of({{1, 2, 3}, {2, 4, 6}, {3, 6, 13}});
  for (const std::int32_t format : kFormats) {
    SmMatrix* m = new_packed(session(), problem, format);
    ASSERT_EQ(factor(m, 0), SM_OK);
    const Dense r = triangle_of_packed(m->dense_factor, 3, format);
    EXPECT_TRUE(near(
        r,
        [] {
          Dense want(3, 3);
          want(0, 0) = 1;
          want(0, 1) = 2;
          want(0, 2) = 3;
          want(2, 2) = 2;
          return want;
        }(),
        1e-15));
    EXPECT_EQ(r(1, 1), 0.0L);
    EXPECT_EQ(m->rank, 2);
  }
}

TEST_P(DenseFactorTest, pivots_are_held_against_the_diagonal_times_the_tolerance) {
  instance()->tolerances[2] = 0.125;
  const auto rank = [&](const Problem& problem, std::int32_t format) {
    SmMatrix* m = new_packed(session(), problem, format);
    EXPECT_EQ(factor(m, 1), SM_OK);
    return m->rank;
  };
  for (const std::int32_t format : kFormats) {
    EXPECT_EQ(rank(bordered(0.25, 2, 0.25), format), 5);  // 0.125 against 0.03125
    EXPECT_EQ(rank(bordered(4.0, 56, 0.25), format), 4);  // 0.5 against 0.5
    EXPECT_EQ(rank(bordered(4.0, 55, 0.25), format), 5);
    EXPECT_EQ(rank(bordered(1.0, 55296, 1.0 / 64), format), 4);  // -12.5, the limit
    SmMatrix* m = new_packed(session(), bordered(1.0, 55297, 1.0 / 64), format);
    EXPECT_EQ(factor(m, 1), SM_NOT_DEFINITE);
  }
}

TEST_P(DenseFactorTest, a_pivot_below_the_negative_limit_leaves_the_values_untouched) {
  for (const std::int32_t format : kFormats)
    for (const std::int32_t in_place : {0, 1})
      for (const Problem& problem : {problem_of({{4, 2, 1}, {2, 0.5, 1}, {1, 1, 9}}), problem_of({{1, 0}, {0, -0.2}}),
                                     problem_of({{std::nextafter(-0.1, -1.0)}})}) {
        SmMatrix* m = new_packed(session(), problem, format);
        const std::vector<std::uint64_t> values = bits(m->values, m->nnz);
        const std::int64_t loose = host().live_blocks() - owned_blocks(m);
        EXPECT_EQ(factor(m, in_place), SM_NOT_DEFINITE);
        EXPECT_EQ(m->definite, 0);
        EXPECT_EQ(m->state, SM_STATE_CLOSED);
        EXPECT_EQ(bits(m->values, m->nnz), values);
        EXPECT_EQ(host().live_blocks() - owned_blocks(m), loose);
      }
}

TEST_P(DenseFactorTest, a_pivot_down_to_the_negative_limit_or_not_a_number_is_dropped) {
  Problem nan = problem_of({{4, 2}, {2, 1}});
  nan.upper[2].value = std::nan("");
  for (const std::int32_t format : kFormats)
    for (const Problem& problem :
         {problem_of({{1, 0}, {0, -0.05}}), problem_of({{4, 0}, {0, -0.1}}), problem_of({{4, 0}, {0, 0}}), nan}) {
      SmMatrix* m = new_packed(session(), problem, format);
      EXPECT_EQ(factor(m, 1), SM_OK);
      EXPECT_EQ(m->definite, 1);
      EXPECT_EQ(m->rank, 1);
      EXPECT_EQ(m->values[2], 0.0);
    }
}

TEST_P(DenseFactorTest, factoring_in_place_gives_a_separate_array_back_first) {
  for (const std::int32_t format : kFormats) {
    const Problem good = problem_of({{4, 2}, {2, 5}});
    std::vector<double> data = packed(problem_of({{4, 2}, {2, -5}}), format);
    SmMatrix* m = tied(data, 2, format);
    const std::int64_t blocks = host().live_blocks();
    EXPECT_EQ(factor(m, 0), SM_NOT_DEFINITE);
    if (!m->dense_factor) m->dense_factor = static_cast<double*>(m->pool->allocate(m->pool, 24, 0));
    const std::vector<double> now = packed(good, format);
    std::copy(now.begin(), now.end(), data.begin());  // the tied array stays where it is
    EXPECT_EQ(factor(m, 1), SM_OK);
    EXPECT_EQ(m->dense_factor, nullptr);
    EXPECT_EQ(host().live_blocks(), blocks);
    expect_factor(data.data(), good, format, tolerance());
  }
}

TEST_P(DenseFactorTest, a_stale_separate_array_is_filled_from_the_values) {
  for (const std::int32_t format : kFormats) {
    const Problem problem = problem_of({{4, 2}, {2, 5}});
    SmMatrix* m = new_packed(session(), problem, format);
    m->dense_factor = static_cast<double*>(m->pool->allocate(m->pool, 24, 0));
    for (int i = 0; i < 3; ++i) m->dense_factor[i] = 1000.0;
    const std::int64_t blocks = host().live_blocks();
    ASSERT_EQ(factor(m, 0), SM_OK);
    expect_factor(m->dense_factor, problem, format, tolerance());
    EXPECT_EQ(host().live_blocks(), blocks);
  }
}

TEST_P(DenseFactorTest, a_tied_array_without_a_pool_can_be_factored) {
  for (const std::int32_t format : kFormats)
    for (const std::int32_t in_place : {0, 1}) {
      const Problem problem = problem_of({{4, 2}, {2, 5}});
      std::vector<double> data = packed(problem, format);
      SmMatrix* m = new_open_tied(session(), data, 2, 2, SM_KIND_SYMMETRIC, format);
      ASSERT_EQ(fn().qxsmclose(m, 0.0), SM_OK);
      ASSERT_EQ(factor(m, in_place), SM_OK);
      expect_factor(in_place ? data.data() : m->dense_factor, problem, format, tolerance());
    }
}

}  // namespace
}  // namespace sm::test
