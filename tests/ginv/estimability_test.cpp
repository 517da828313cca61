// qxsmcke: which vectors lie in the row space of a matrix, or are reproduced by a Hermite form.
#include <algorithm>

#include "ginv/ginv_support.hpp"

namespace sm::test {
namespace {

using Flags = std::vector<std::int32_t>;
constexpr double kTolerance = 1e-8;

struct Check {
  SmStatus status = SM_OK;
  std::int64_t failed = -999;
  Flags flags;
};

class EstimabilityTest : public ModuleTest {
 protected:
  // The flags of the vectors; the one behind them must be left alone.
  Check check(SmMatrix* m, const std::vector<double>& x, std::int32_t k, char mode = 'G',
              double tolerance = kTolerance) {
    Check c;
    c.flags.assign(at(std::max(k, 0)) + 1, 55);
    c.status = fn().qxsmcke(m, x.data(), k, &c.failed, c.flags.data(), mode, tolerance);
    EXPECT_EQ(c.flags.back(), 55);
    c.flags.pop_back();
    std::int64_t count = -999;
    if (c.status == SM_OK) {
      EXPECT_EQ(fn().qxsmcke(m, x.data(), k, &count, nullptr, mode, tolerance), SM_OK) << "without flags";
      EXPECT_EQ(count, c.failed);
    }
    return c;
  }
  // One vector against a Hermite form.
  bool reproduced(SmMatrix* h, const std::vector<double>& x, double tolerance) {
    const Check c = check(h, x, 1, 'H', tolerance);
    EXPECT_EQ(c.status, SM_OK);
    EXPECT_EQ(c.failed, c.flags[0]);
    return c.failed == 0;
  }
  // Everything failed, with this status.
  void expect_unchecked(SmMatrix* m, SmStatus status, char mode = 'G') {
    const Check c = check(m, std::vector<double>(64, 1.0), 3, mode);
    EXPECT_EQ(c.status, status);
    EXPECT_EQ(c.failed, 3);
    EXPECT_EQ(c.flags, (Flags{1, 1, 1}));
  }
};
INSTANTIATE_BOTH_HOSTS(EstimabilityTest);

// Whether x lies in the space that the columns of `a` span.
bool spanned(const Dense& a, const std::vector<double>& x) {
  Dense with(a.rows(), a.cols() + 1);
  for (std::int64_t r = 0; r < a.rows(); ++r) {
    for (std::int64_t c = 0; c < a.cols(); ++c) with(r, c) = a(r, c);
    with(r, a.cols()) = x[at(r)];
  }
  return rank_by_full_pivoting(with) == rank_by_full_pivoting(a);
}

TEST_P(EstimabilityTest, tells_the_vectors_of_the_row_space_from_others) {
  Random random(51);
  for (const Named& problem : semidefinite_problems()) {
    const std::int64_t n = problem.a.rows();
    constexpr std::int32_t kVectors = 12;
    std::vector<double> x;
    Flags want;
    for (int v = 0; v < kVectors; ++v) {
      std::vector<double> one = random.vector(n);
      if (v % 3 != 0) one = product(problem.a, one);
      if (v % 3 == 2) one[at(random.below(n))] += 1.0;
      want.push_back(spanned(problem.a, one) ? 0 : 1);
      x.insert(x.end(), one.begin(), one.end());
    }
    for (const Shape shape : kSymmetricShapes) {
      SCOPED_TRACE(problem.name + ' ' + name_of(shape));
      SmMatrix* m = build(session(), shape, problem.a);
      for (int again = 0; again < 2; ++again) {
        const Check c = check(m, x, kVectors);
        EXPECT_EQ(c.status, SM_OK);
        EXPECT_EQ(c.flags, want);
        EXPECT_EQ(c.failed, std::count(want.begin(), want.end(), 1));
        EXPECT_EQ(m->state, SM_STATE_FACTORED);
      }
      EXPECT_TRUE(near(contents(m), problem.a, 0.0)) << "the matrix is as it was";
    }
  }
}

TEST_P(EstimabilityTest, serves_a_sparse_matrix_in_every_state_and_a_packed_inverse_in_format_23) {
  const Dense a = from_rows({{4, 4, 2}, {4, 4, 2}, {2, 2, 5}});
  const std::vector<double> x{1, 1, 7, 1, 0, 0, 0, 0, 1};
  for (std::int32_t state = SM_STATE_CLOSED; state <= SM_STATE_FACTORED; ++state) {
    SmMatrix* m = build(session(), kSymmetricSparse, a);
    ASSERT_EQ(bring_to(m, state), SM_OK);
    EXPECT_EQ(check(m, x, 3).flags, (Flags{0, 1, 0}));
  }
  SmMatrix* inverted = build(session(), kSymmetricRows, a);
  ASSERT_EQ(fn().qxsminv(inverted, 0, kNan), SM_OK);
  const Check c = check(inverted, x, 3);
  EXPECT_EQ(c.flags, (Flags{0, 1, 0}));
  EXPECT_EQ(c.failed, 1);
  EXPECT_EQ(inverted->state, SM_STATE_INVERTED);
}

TEST_P(EstimabilityTest, answers_the_status_of_the_solve_when_nothing_can_be_solved) {
  const Dense a = from_rows({{4, 2}, {2, 5}});
  SmMatrix* inverted = build(session(), kSymmetricColumns, a);
  ASSERT_EQ(fn().qxsminv(inverted, 0, kNan), SM_OK);
  expect_unchecked(inverted, SM_WRONG_STATE);
  for (const Shape shape : kPacked) {
    SmMatrix* factored = build(session(), shape, a);
    ASSERT_EQ(fn().qxsmfact(factored, 1), SM_OK);
    expect_unchecked(factored, SM_NO_FACTOR);
    SmMatrix* in_place = build(session(), shape, a);
    ASSERT_EQ(fn().qxsminv(in_place, 1, kNan), SM_OK);
    expect_unchecked(in_place, SM_NO_FACTOR);
  }
  for (const Shape shape : kSymmetricShapes) {
    SmMatrix* indefinite = build(session(), shape, from_rows({{4, 1}, {1, -3}}));
    expect_unchecked(indefinite, SM_NOT_DEFINITE);
  }
}

TEST_P(EstimabilityTest, compares_each_vector_with_its_product_with_a_hermite_form) {
  Random random(52);
  const Dense h = random_dense(random, 6, 6, 40);
  SmMatrix* m = build(session(), kGeneralSparse, h);
  std::vector<double> x;
  std::vector<double> distance;
  for (int v = 0; v < 20; ++v) {
    const std::vector<double> one = random.vector(6);
    const std::vector<double> z = product(transposed(h), one);
    double most = 0.0;
    double apart = 0.0;
    for (std::size_t i = 0; i < 6; ++i) {
      most = std::max(most, std::fabs(one[i]));
      apart = std::max(apart, std::fabs(one[i] - z[i]));
    }
    distance.push_back(apart / most);
    x.insert(x.end(), one.begin(), one.end());
  }
  std::vector<double> ordered = distance;
  std::sort(ordered.begin(), ordered.end());
  const double tolerance = (ordered[9] + ordered[10]) / 2;
  ASSERT_LT(ordered[9], ordered[10]);
  const Check c = check(m, x, 20, 'H', tolerance);
  EXPECT_EQ(c.status, SM_OK);
  EXPECT_EQ(c.failed, 10);
  for (std::size_t v = 0; v < 20; ++v) EXPECT_EQ(c.flags[v], distance[v] <= tolerance ? 0 : 1) << v;
}

TEST_P(EstimabilityTest, the_bound_is_relative_to_the_largest_magnitude_and_includes_its_end) {
  SmMatrix* h = build(session(), kGeneralSparse, from_diagonal({1.0, 0.5}));
  const std::vector<double> x{-1024.0, 1.0};  // off by 0.5 in the second place
  EXPECT_TRUE(reproduced(h, x, 0.5 / 1024.0));
  EXPECT_FALSE(reproduced(h, x, std::nextafter(0.5 / 1024.0, 0.0)));
  SmMatrix* first = build(session(), kGeneralSparse, from_diagonal({0.5, 1.0}));
  EXPECT_FALSE(reproduced(first, x, 0.25)) << "an element in front counts like one behind";
  EXPECT_TRUE(reproduced(first, x, 0.5));
}

TEST_P(EstimabilityTest, a_zero_tolerance_passes_only_what_is_reproduced_exactly) {
  SmMatrix* exact = build(session(), kSymmetricSparse, from_diagonal({1, 2, 4}));
  EXPECT_EQ(check(exact, {3, 5, 7, 0, 0, 0}, 2, 'G', 0.0).failed, 0);
  SmMatrix* h = build(session(), kGeneralSparse, from_diagonal({1.0, std::nextafter(1.0, 2.0)}));
  EXPECT_TRUE(reproduced(h, {1.0, 0.0}, 0.0));
  EXPECT_FALSE(reproduced(h, {1.0, 1.0}, 0.0));
  EXPECT_TRUE(reproduced(h, {1.0, 1.0}, 1e-15));
}

TEST_P(EstimabilityTest, a_vector_of_zeros_always_passes) {
  Random random(53);
  SmMatrix* h = build(session(), kGeneralSparse, random_dense(random, 3, 3));
  const std::vector<double> zeros(3, 0.0);
  for (const double tolerance : {0.0, 1e-8, 5.0}) EXPECT_TRUE(reproduced(h, zeros, tolerance));
  for (const Shape shape : kSymmetricShapes) {
    for (const Dense& a : {from_diagonal({1, 2, 4}), from_diagonal({0, 0, 0})}) {
      EXPECT_EQ(check(build(session(), shape, a), zeros, 1, 'G', 0.0).failed, 0) << name_of(shape);
    }
  }
}

TEST_P(EstimabilityTest, a_nan_in_a_comparison_fails_the_vector) {
  SmMatrix* h = build(session(), kGeneralSparse, from_diagonal({1, 1, 1}));
  const double huge = std::numeric_limits<double>::max();
  for (std::size_t place = 0; place < 3; ++place) {
    std::vector<double> x{1, 2, 3};
    x[place] = kNan;
    EXPECT_FALSE(reproduced(h, x, 1e300)) << "a NaN in the vector, place " << place;
    x[place] = kInfinity;
    EXPECT_FALSE(reproduced(h, x, 1.0)) << "infinity less infinity, place " << place;
  }
  EXPECT_FALSE(reproduced(h, {1, 2, 3}, kNan)) << "a NaN as tolerance";
  EXPECT_FALSE(reproduced(h, {0, 0, 0}, kNan));
  EXPECT_FALSE(reproduced(h, {1, 2, 3}, -1e-8));
  SmMatrix* broken = build(session(), kGeneralSparse, from_rows({{1, 0}, {0, 1}}));
  ASSERT_EQ(fn().qxsmassign(broken, 1, 0, 0, kNan), SM_OK);
  EXPECT_FALSE(reproduced(broken, {1, 2}, huge)) << "a NaN in the form";
  EXPECT_TRUE(reproduced(broken, {1, 0}, 0.0)) << "a row that meets a 0 is not looked at";
  for (const Shape shape : kSymmetricShapes) {
    const Check c = check(build(session(), shape, from_diagonal({1, 2})), {kNan, 1, 1, 1}, 2);
    EXPECT_EQ(c.flags, (Flags{1, 0})) << name_of(shape);
    EXPECT_EQ(c.failed, 1);
  }
}

TEST_P(EstimabilityTest, an_infinity_or_nan_of_the_vector_is_multiplied_with_its_row_of_the_form) {
  // x H sees row 1 only where x is not 0; a NaN is not 0.
  SmMatrix* h = build(session(), kGeneralSparse, from_rows({{1, 0}, {kInfinity, 1}}));
  EXPECT_TRUE(reproduced(h, {4, 0}, 0.0));
  EXPECT_FALSE(reproduced(h, {4, 1e-300}, 1e300));
}

TEST_P(EstimabilityTest, what_cannot_be_checked_stays_failed_without_a_complaint) {
  for (const char mode : {'G', 'h', '\0', ' '})
    for (const Shape shape : {kGeneralSparse, kGeneralColumns, kGeneralRows, kDiagonalColumns, kDiagonalRows}) {
      SCOPED_TRACE(name_of(shape));
      expect_unchecked(build(session(), shape, from_diagonal({1, 1})), SM_OK, mode);
    }
  for (const Shape shape : kShapes)
    if (shape.kind != SM_KIND_GENERAL || !is_sparse(shape)) {
      SCOPED_TRACE(name_of(shape));
      SmMatrix* m = build(session(), shape, from_diagonal({1, 1}));
      expect_unchecked(m, SM_OK, 'H');
      EXPECT_EQ(m->state, SM_STATE_CLOSED) << "nothing is factored";
    }
}

TEST_P(EstimabilityTest, everything_counts_as_failed_before_any_check) {
  expect_unchecked(new_untyped(session()), SM_OK);
  expect_unchecked(build_open(session(), Dense(0, 0)), SM_OK);
  expect_unchecked(new_sized(session(), kGeneralSparse, 2, 3), SM_OK);  // empty before the shape
  SmMatrix* none = new_untyped_with_an_entry(session());
  expect_unchecked(none, SM_NOT_CLOSED);
  none->state = SM_STATE_CLOSED;
  expect_unchecked(none, SM_NOT_CLOSED);
  none->state = SM_STATE_OPEN;
  for (const char mode : {'G', 'H'}) {
    expect_unchecked(build_open(session(), from_diagonal({1, 1})), SM_NOT_CLOSED, mode);
    std::vector<double> data(6, 1.0);
    expect_unchecked(new_open_tied(session(), data, 2, 3, SM_KIND_GENERAL, SM_FORMAT_ROWS), SM_NOT_CLOSED, mode);
    for (const Shape shape : {kGeneralSparse, kGeneralColumns, kGeneralRows}) {
      expect_unchecked(build(session(), shape, from_rows({{1, 2, 3}, {4, 5, 6}})), SM_NOT_CLOSED, mode);
    }
  }
}

TEST_P(EstimabilityTest, no_vectors_are_an_answer_once_the_matrix_is_fit) {
  for (const char mode : {'G', 'H'})
    for (const std::int32_t k : {0, -2}) {
      for (const Shape shape : kShapes) {
        SmMatrix* m = build(session(), shape, from_diagonal({1, 1}));
        host().fail_request(0, true);
        const Check c = check(m, {}, k, mode);
        EXPECT_EQ(host().stop_failing(), 0) << "nothing is allocated";
        EXPECT_EQ(c.status, SM_OK);
        EXPECT_EQ(c.failed, k);
        EXPECT_EQ(m->state, SM_STATE_CLOSED);
      }
      const Check c = check(build_open(session(), from_diagonal({1, 1})), {}, k, mode);
      EXPECT_EQ(c.status, SM_NOT_CLOSED);
      EXPECT_EQ(c.failed, k);
    }
}

TEST_P(EstimabilityTest, only_the_status_of_the_last_vector_is_told) {
  // Each vector costs a packed solve one request; two work vectors come first.
  const std::vector<double> x{1, 2, 3, 4, 5, 6};
  for (const Shape shape : kPacked)
    for (std::int64_t refused = 0; refused < 5; ++refused) {
      SCOPED_TRACE(name_of(shape) + " request " + std::to_string(refused));
      SmMatrix* m = build(session(), shape, from_rows({{4, 2}, {2, 5}}));
      ASSERT_EQ(fn().qxsmfact(m, 0), SM_OK);
      const std::int64_t blocks = host().live_blocks();
      std::int64_t failed = -1;
      Flags flags(3, 55);
      host().fail_request(refused, false);
      const SmStatus status = fn().qxsmcke(m, x.data(), 3, &failed, flags.data(), 'G', kTolerance);
      EXPECT_EQ(host().stop_failing(), 1);
      EXPECT_EQ(host().live_blocks(), blocks);
      EXPECT_EQ(status, refused == 2 || refused == 3 ? SM_OK : SM_NO_MEMORY);
      Flags want(3, refused < 2 ? 1 : 0);
      if (refused >= 2) want[at(refused - 2)] = 1;
      EXPECT_EQ(flags, want);
      EXPECT_EQ(failed, std::count(want.begin(), want.end(), 1));
    }
}

TEST_P(EstimabilityTest, a_vector_whose_factoring_was_refused_fails_and_the_next_one_factors) {
  SmMatrix* m = build(session(), kSymmetricSparse, from_rows({{4, 2}, {2, 5}}));
  std::int64_t failed = -1;
  Flags flags(2, 55);
  const std::vector<double> x{1, 2, 3, 4};
  host().fail_request(2, false);
  EXPECT_EQ(fn().qxsmcke(m, x.data(), 2, &failed, flags.data(), 'G', kTolerance), SM_OK);
  EXPECT_EQ(host().stop_failing(), 1);
  EXPECT_EQ(flags, (Flags{1, 0}));
  EXPECT_EQ(failed, 1);
  EXPECT_EQ(m->state, SM_STATE_FACTORED);
}

}  // namespace
}  // namespace sm::test
