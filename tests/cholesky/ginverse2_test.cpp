// The dense routine behind packed factors and inverses, reached past the shared library.
#include "cholesky/ginverse2.hpp"

#include <cmath>

#include "cholesky/cholesky_support.hpp"
#include "cholesky/pivot_cases.hpp"

namespace sm::test {
namespace {

constexpr std::int32_t kFormats[] = {SM_FORMAT_COLUMNS, SM_FORMAT_ROWS};
constexpr std::int32_t kInvert = 0;
constexpr std::int32_t kFactor = 5;
constexpr std::int32_t kInvertFactor = 6;

struct Answer {
  SmStatus status = SM_OK;
  std::vector<double> array;
  double log_det = -1.0;
  std::int64_t rank = -1;
  std::int16_t definite = -1;
};

class DenseInverseTest : public ModuleTest {
 protected:
  static constexpr double kTolerance = 1e-12;
  Answer run(std::vector<double> array, std::int64_t n, std::int32_t mode, std::int32_t format,
             double tolerance = kTolerance) {
    Answer a;
    a.array = std::move(array);
    const std::int64_t blocks = host().live_blocks();
    a.status = ginverse2(instance(), a.array.data(), n, &a.log_det, &a.rank, mode, tolerance, format, &a.definite);
    EXPECT_EQ(host().live_blocks(), blocks);
    return a;
  }
  Answer run(const Problem& problem, std::int32_t mode, std::int32_t format, double tolerance = kTolerance) {
    return run(packed(problem, format), problem.n, mode, format, tolerance);
  }
};
INSTANTIATE_BOTH_HOSTS(DenseInverseTest);

// The inverse of the accepted block in natural order, zeros elsewhere.
Dense wanted_inverse(const Problem& problem, double tolerance) {
  const DenseFactor f = factor_with_drops(problem.dense(), tolerance);
  const Dense block = inverse(principal(problem.dense(), f.accepted));
  Dense g(problem.n, problem.n);
  for (std::int64_t i = 0, bi = 0; i < problem.n; ++i) {
    if (!f.accepted[at(i)]) continue;
    for (std::int64_t j = 0, bj = 0; j < problem.n; ++j)
      if (f.accepted[at(j)]) g(i, j) = block(bi, bj++);
    ++bi;
  }
  return g;
}

TEST_P(DenseInverseTest, inverts_a_definite_matrix_directly_and_from_its_factor) {
  for (std::uint64_t seed = 0; seed < 60; ++seed) {
    Random random(seed);
    const std::int64_t n = 1 + random.below(20);
    const Problem problem = positive_definite(random_graph(random, n, 50), random);
    const auto log_det = static_cast<double>(log_determinant(problem.dense()));
    for (const std::int32_t format : kFormats) {
      const Answer direct = run(problem, kInvert, format);
      ASSERT_EQ(direct.status, SM_OK);
      EXPECT_EQ(direct.rank, n);
      EXPECT_EQ(direct.definite, 1);
      EXPECT_NEAR(direct.log_det, log_det, 1e-11);
      const Dense g = dense_of_packed(direct.array.data(), n, format);
      EXPECT_TRUE(near(g, inverse(problem.dense()), 1e-12)) << "seed " << seed;
      EXPECT_TRUE(near(product(g, problem.dense()), identity(n), 1e-11)) << "seed " << seed;

      const Answer factor = run(problem, kFactor, format);
      ASSERT_EQ(factor.status, SM_OK);
      EXPECT_NEAR(factor.log_det, log_det, 1e-11);
      const Dense r = triangle_of_packed(factor.array.data(), n, format);
      EXPECT_TRUE(near(product(transposed(r), r), problem.dense(), 1e-13)) << "seed " << seed;
      const Answer from_factor = run(factor.array, n, kInvertFactor, format);
      ASSERT_EQ(from_factor.status, SM_OK);
      EXPECT_EQ(from_factor.rank, n);
      EXPECT_NEAR(from_factor.log_det, log_det, 1e-11);
      EXPECT_TRUE(near(dense_of_packed(from_factor.array.data(), n, format), g, 1e-12)) << "seed " << seed;
    }
    if (HasFailure()) FAIL() << "seed " << seed;
  }
}

TEST_P(DenseInverseTest, gives_a_reflexive_generalized_inverse_of_a_singular_matrix) {
  for (std::uint64_t seed = 0; seed < 60; ++seed) {
    Random random(seed);
    const Semidefinite s = cross_product(random, 1 + random.below(12), random.below(6), random.below(4));
    const std::int64_t n = s.problem.n;
    const Dense a = s.problem.dense();
    const Dense want = wanted_inverse(s.problem, kTolerance);
    for (const std::int32_t format : kFormats) {
      const Answer direct = run(s.problem, kInvert, format);
      ASSERT_EQ(direct.status, SM_OK);
      EXPECT_EQ(direct.rank, s.rank);
      const Answer factor = run(s.problem, kFactor, format);
      ASSERT_EQ(factor.status, SM_OK);
      EXPECT_EQ(factor.rank, s.rank);
      EXPECT_NEAR(factor.log_det, direct.log_det, 1e-11);
      const Answer from_factor = run(factor.array, n, kInvertFactor, format);
      ASSERT_EQ(from_factor.status, SM_OK);
      EXPECT_EQ(from_factor.rank, s.rank);
      for (const Answer* answer : {&direct, &from_factor}) {
        const Dense g = dense_of_packed(answer->array.data(), n, format);
        EXPECT_TRUE(near(g, want, 1e-12)) << "seed " << seed;
        EXPECT_TRUE(near(product(product(a, g), a), a, 1e-11)) << "seed " << seed;
        EXPECT_TRUE(near(product(product(g, a), g), g, 1e-11)) << "seed " << seed;
      }
      const DenseFactor reference = factor_with_drops(a, kTolerance);
      for (std::int64_t i = 0; i < n; ++i) {
        if (reference.accepted[at(i)]) continue;
        for (std::int64_t j = 0; j < n; ++j) {
          const std::int64_t p = packed_position(n, format, std::min(i, j), std::max(i, j));
          EXPECT_EQ(direct.array[at(p)], 0.0) << "row " << i << " is dropped";
          EXPECT_EQ(from_factor.array[at(p)], 0.0) << "row " << i << " is dropped";
        }
      }
    }
    if (HasFailure()) FAIL() << "seed " << seed;
  }
}

TEST_P(DenseInverseTest, of_two_equal_rows_the_first_is_kept) {
  const Problem problem = problem_of({{4, 4, 0}, {4, 4, 0}, {0, 0, 2}});
  for (const std::int32_t format : kFormats) {
    const Answer a = run(problem, kInvert, format);
    Dense want(3, 3);
    want(0, 0) = 0.25L;
    want(2, 2) = 0.5L;
    EXPECT_TRUE(near(dense_of_packed(a.array.data(), 3, format), want, 1e-15));
    EXPECT_EQ(a.rank, 2);
    EXPECT_NEAR(a.log_det, std::log(8.0), 1e-15);
  }
}

TEST_P(DenseInverseTest, order_one_gives_the_reciprocal_or_zero) {
  for (const std::int32_t format : kFormats) {
    const Answer regular = run({4.0}, 1, kInvert, format);
    EXPECT_EQ(regular.status, SM_OK);
    EXPECT_EQ(regular.array[0], 0.25);
    EXPECT_EQ(regular.rank, 1);
    EXPECT_DOUBLE_EQ(regular.log_det, std::log(4.0));
    for (const double d : {0.0, -0.05, -0.1, std::nan("")}) {
      const Answer singular = run({d}, 1, kInvert, format);
      EXPECT_EQ(singular.status, SM_OK) << d;
      EXPECT_EQ(singular.array[0], 0.0) << d;
      EXPECT_EQ(singular.rank, 0) << d;
      EXPECT_EQ(singular.log_det, 0.0) << d;
      EXPECT_EQ(singular.definite, 1) << d;
      const Answer factor = run({d}, 1, kFactor, format);
      EXPECT_EQ(factor.array[0], 0.0) << d;
      EXPECT_EQ(factor.rank, 0) << d;
    }
    EXPECT_EQ(run({4.0}, 1, kFactor, format).array[0], 2.0);
    EXPECT_EQ(run({2.0}, 1, kInvertFactor, format).array[0], 0.25);
    EXPECT_EQ(run({0.0}, 1, kInvertFactor, format).array[0], 0.0);
    const Answer negative = run({-3.0}, 1, kInvertFactor, format);  // counts as dropped
    EXPECT_EQ(negative.array[0], 0.0);
    EXPECT_EQ(negative.rank, 0);
    EXPECT_EQ(negative.log_det, 0.0);
  }
}

TEST_P(DenseInverseTest, order_zero_is_no_work) {
  for (const std::int32_t mode : {kInvert, kFactor, kInvertFactor})
    for (const std::int32_t format : kFormats) {
      const Answer a = run(std::vector<double>{}, 0, mode, format);
      EXPECT_EQ(a.status, SM_OK);
      EXPECT_EQ(a.rank, 0);
      EXPECT_EQ(a.log_det, 0.0);
    }
}

TEST_P(DenseInverseTest, a_pivot_is_accepted_above_its_diagonal_times_the_tolerance) {
  for (const std::int32_t mode : {kInvert, kFactor})
    for (const std::int32_t format : kFormats) {
      EXPECT_EQ(run(bordered(0.25, 2, 0.25), mode, format, 0.125).rank, 5);
      EXPECT_EQ(run(bordered(4.0, 56, 0.25), mode, format, 0.125).rank, 4);
      EXPECT_EQ(run(bordered(4.0, 55, 0.25), mode, format, 0.125).rank, 5);
      const double tolerance = instance()->tolerances[2];
      const double unit = std::ldexp(1.0, -26);
      for (const ExactThreshold& c : exact_thresholds(tolerance, 4)) {
        EXPECT_EQ(run(bordered(c.a, c.steps, unit), mode, format, tolerance).rank, 4);
        EXPECT_EQ(run(bordered(c.a, c.steps - 1, unit), mode, format, tolerance).rank, 5);
      }
    }
}

TEST_P(DenseInverseTest, a_pivot_below_the_negative_limit_answers_103_and_leaves_the_array) {
  struct Case {
    Problem problem;
    double tolerance;
    SmStatus status;
  };
  const std::vector<Case> cases = {
      {problem_of({{1, 0}, {0, -0.1}}), kTolerance, SM_OK},
      {problem_of({{1, 0}, {0, std::nextafter(-0.1, -1.0)}}), kTolerance, SM_NOT_DEFINITE},
      {problem_of({{4, 2, 1}, {2, 0.5, 1}, {1, 1, 9}}), kTolerance, SM_NOT_DEFINITE},
      {bordered(1.0, 55296, 1.0 / 64), 0.125, SM_OK},  // -12.5, the limit
      {bordered(1.0, 55297, 1.0 / 64), 0.125, SM_NOT_DEFINITE},
      {bordered(1.0, 6, 1.0), 0.1, SM_OK},  // -5 against -10
      {bordered(1.0, 6, 1.0), std::nextafter(0.1, 0.0), SM_NOT_DEFINITE},
  };
  for (const std::int32_t mode : {kInvert, kFactor})
    for (const std::int32_t format : kFormats)
      for (std::size_t i = 0; i < cases.size(); ++i) {
        const Answer a = run(cases[i].problem, mode, format, cases[i].tolerance);
        EXPECT_EQ(a.status, cases[i].status) << "case " << i;
        EXPECT_EQ(a.definite, a.status == SM_OK ? 1 : 0) << "case " << i;
        if (a.status != SM_OK) {
          EXPECT_EQ(bits(a.array), bits(packed(cases[i].problem, format))) << "case " << i;
        }
      }
}

TEST_P(DenseInverseTest, a_refused_block_answers_101_and_leaves_the_array) {
  Random random(1);
  const Problem problem = positive_definite(random_graph(random, 12, 70), random);
  for (const std::int32_t format : kFormats) {
    const std::vector<double> matrix = packed(problem, format);
    const std::vector<double> factor = run(problem, kFactor, format).array;
    for (const std::int32_t mode : {kInvert, kFactor, kInvertFactor})
      for (std::int64_t k = 0;; ++k) {
        const std::vector<double>& given = mode == kInvertFactor ? factor : matrix;
        host().fail_request(k, false);
        const Answer a = run(given, 12, mode, format);
        if (host().stop_failing() == 0) {
          EXPECT_EQ(a.status, SM_OK);
          break;
        }
        EXPECT_EQ(a.status, SM_NO_MEMORY) << "mode " << mode << ", request " << k;
        EXPECT_EQ(bits(a.array), bits(given)) << "mode " << mode << ", request " << k;
        ASSERT_LT(k, 100);
      }
  }
}

TEST_P(DenseInverseTest, the_two_formats_give_the_same_matrix) {
  Random random(8);
  const Semidefinite s = cross_product(random, 9, 3, 1);
  for (const std::int32_t mode : {kInvert, kFactor}) {
    const Answer by_columns = run(s.problem, mode, SM_FORMAT_COLUMNS);
    const Answer by_rows = run(s.problem, mode, SM_FORMAT_ROWS);
    EXPECT_TRUE(near(triangle_of_packed(by_columns.array.data(), 13, SM_FORMAT_COLUMNS),
                     triangle_of_packed(by_rows.array.data(), 13, SM_FORMAT_ROWS), 1e-13));
    EXPECT_NEAR(by_columns.log_det, by_rows.log_det, 1e-12);
  }
}

}  // namespace
}  // namespace sm::test
