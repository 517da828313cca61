// The trace of a product: qxsmtraceAB.
#include <gtest/gtest.h>

#include <tuple>

#include "cholesky/cholesky_support.hpp"
#include "store/filled.hpp"

namespace sm::test {
namespace {

bool served(Shape a, Shape b) {
  switch (a.kind) {
    case SM_KIND_DIAGONAL:
      return true;
    case SM_KIND_SYMMETRIC:
      return a.format != SM_FORMAT_COLUMNS || b.kind != SM_KIND_GENERAL;
    default:
      return b.kind == SM_KIND_GENERAL;
  }
}

// Sum of a(i, j) b(j, i), where b has a column i. Multiples of 1/4096: exact.
double expected(const Dense& a, const Dense& b) {
  long double sum = 0.0L;
  for (std::int64_t i = 0; i < a.rows() && i < b.cols(); ++i)
    for (std::int64_t j = 0; j < a.cols(); ++j) sum += a(i, j) * b(j, i);
  return static_cast<double>(sum);
}

class ProductTrace : public ModuleTest {
 protected:
  double trace_of(SmMatrix* a, SmMatrix* b) {
    Output out(1);
    EXPECT_EQ(fn().qxsmtraceAB(a, b, out.data()), SM_OK);
    return out.values()[0];
  }
  // A square matrix of multiples of 1/64, brought to the state when it is symmetric sparse.
  Filled in_state(Shape shape, std::int64_t n, std::int32_t state, Random& random) {
    if (shape.kind == SM_KIND_GENERAL) return filled(session(), shape, n, n, random);
    Filled a = filled_definite(session(), shape, n, random);
    if (is_sparse(shape)) {
      EXPECT_EQ(bring_to(a.matrix, state), SM_OK);
    }
    return a;
  }
};

TEST_P(ProductTrace, every_pair_of_shapes_that_is_served_sums_every_product) {
  Random random(1);
  for (const Shape sa : kShapes)
    for (const Shape sb : kShapes) {
      if (!served(sa, sb)) continue;
      for (const std::int64_t n : {1, 2, 5, 17}) {
        const Filled a = filled(session(), sa, n, n, random);
        const Filled b = filled(session(), sb, n, n, random);
        EXPECT_EQ(trace_of(a.matrix, b.matrix), expected(a.dense, b.dense)) << name_of(sa) << ", " << name_of(sb);
        EXPECT_EQ(entries(a.matrix), a.stored);
        EXPECT_EQ(entries(b.matrix), b.stored);
      }
    }
}

TEST_P(ProductTrace, elements_that_would_meet_one_outside_the_second_matrix_add_nothing) {
  Random random(2);
  using Sizes = std::tuple<std::int64_t, std::int64_t, std::int64_t>;
  for (const Shape sa : kShapes)
    for (const Shape sb : {kGeneralSparse, kGeneralColumns, kGeneralRows})
      for (const auto& [r, c, k] : {Sizes{3, 5, 3}, Sizes{5, 3, 5}, Sizes{6, 4, 2}, Sizes{2, 4, 6}, Sizes{1, 8, 3},
                                    Sizes{8, 1, 3}, Sizes{4, 4, 1}, Sizes{4, 4, 9}, Sizes{7, 7, 6}}) {
        if (!served(sa, sb) || (sa.kind != SM_KIND_GENERAL && r != c)) continue;
        const Filled a = filled(session(), sa, r, c, random);
        const Filled b = filled(session(), sb, c, k, random);
        EXPECT_EQ(trace_of(a.matrix, b.matrix), expected(a.dense, b.dense))
            << name_of(sa) << ", " << name_of(sb) << ' ' << r << ' ' << c << ' ' << k;
      }
}

TEST_P(ProductTrace, two_symmetric_matrices_count_what_lies_beside_the_diagonal_twice) {
  for (const Shape sa : {kSymmetricSparse, kSymmetricColumns, kSymmetricRows})
    for (const Shape sb : {kSymmetricSparse, kSymmetricColumns, kSymmetricRows}) {
      const Nonzeros elements{{{0, 0}, 1.0}, {{0, 1}, 2.0}, {{1, 1}, 1.0}};
      SmMatrix* a = filled_with(session(), sa, 2, 2, elements).matrix;
      SmMatrix* b = filled_with(session(), sb, 2, 2, elements).matrix;
      EXPECT_EQ(trace_of(a, b), 10.0) << name_of(sa) << ", " << name_of(sb);
      EXPECT_EQ(trace_of(a, a), 10.0) << name_of(sa) << " with itself";
    }
}

TEST_P(ProductTrace, a_symmetric_matrix_meets_both_triangles_of_a_general_one) {
  for (const Shape sa : {kSymmetricSparse, kSymmetricRows})
    for (const Shape sb : {kGeneralSparse, kGeneralColumns, kGeneralRows}) {
      SmMatrix* a = filled_with(session(), sa, 2, 2, {{{0, 1}, 2.0}, {{1, 1}, 16.0}}).matrix;
      SmMatrix* b = filled_with(session(), sb, 2, 2, {{{0, 1}, 1.0}, {{1, 0}, 4.0}, {{1, 1}, 1.0}}).matrix;
      EXPECT_EQ(trace_of(a, b), 2.0 * (1.0 + 4.0) + 16.0) << name_of(sa) << ", " << name_of(sb);
    }
}

TEST_P(ProductTrace, a_matrix_may_meet_itself) {
  Random random(3);
  for (const Shape shape : kShapes) {
    const Filled a = filled(session(), shape, 7, 7, random);
    EXPECT_EQ(trace_of(a.matrix, a.matrix), expected(a.dense, a.dense)) << name_of(shape);
  }
}

TEST_P(ProductTrace, the_trace_is_true_in_every_state_but_that_of_two_sparse_matrices_with_a_reordered_second) {
  Random random(4);
  for (const Shape sa : kShapes)
    for (const Shape sb : kShapes) {
      if (!served(sa, sb)) continue;
      for (std::int32_t first = SM_STATE_CLOSED; first <= SM_STATE_FACTORED; ++first)
        for (std::int32_t second = SM_STATE_CLOSED; second <= SM_STATE_FACTORED; ++second) {
          const bool sparse_a = sa.kind == SM_KIND_SYMMETRIC && is_sparse(sa);
          const bool sparse_b = sb.kind == SM_KIND_SYMMETRIC && is_sparse(sb);
          if ((!sparse_a && first > SM_STATE_CLOSED) || (!sparse_b && second > SM_STATE_CLOSED)) continue;
          const Filled a = in_state(sa, 12, first, random);
          const Filled b = in_state(sb, 12, second, random);
          const double got = trace_of(a.matrix, b.matrix);
          SCOPED_TRACE(name_of(sa) + " in " + std::to_string(first) + ", " + name_of(sb) + " in " +
                       std::to_string(second));
          if (sparse_a && sparse_b && second > SM_STATE_ORDERED) {
            EXPECT_TRUE(is_missing(got));
          } else {
            EXPECT_EQ(got, expected(a.dense, b.dense));
          }
        }
    }
}

TEST_P(ProductTrace, a_reordered_matrix_does_not_meet_itself) {
  Random random(5);
  const Filled a = filled_definite(session(), kSymmetricSparse, 9, random);
  ASSERT_EQ(bring_to(a.matrix, SM_STATE_ORDERED), SM_OK);
  EXPECT_EQ(trace_of(a.matrix, a.matrix), expected(a.dense, a.dense));
  ASSERT_EQ(bring_to(a.matrix, SM_STATE_REORDERED), SM_OK);
  EXPECT_TRUE(is_missing(trace_of(a.matrix, a.matrix)));
}

TEST_P(ProductTrace, factored_and_inverted_matrices_with_an_array_of_their_own_count_by_their_values) {
  Random random(6);
  for (const Shape sa : kSquareFactored)
    for (const Shape sb : kSquareFactored) {
      const Filled a = filled_definite(session(), sa, 6, random);
      const Filled b = filled_definite(session(), sb, 6, random);
      ASSERT_EQ(fn().qxsmfact(a.matrix, 0), SM_OK);
      ASSERT_EQ(fn().qxsminv(b.matrix, 0, kNan), SM_OK);
      EXPECT_EQ(trace_of(a.matrix, b.matrix), expected(a.dense, b.dense)) << name_of(sa) << ", " << name_of(sb);
      EXPECT_EQ(trace_of(b.matrix, a.matrix), expected(b.dense, a.dense)) << name_of(sb) << ", " << name_of(sa);
    }
}

TEST_P(ProductTrace, one_empty_matrix_of_two_gives_0) {
  Random random(7);
  SmMatrix* trees = new_sized(session(), kGeneralSparse, 4, 4);
  for (const Shape shape : kShapes) {
    SmMatrix* other = filled(session(), shape, 4, 4, random).matrix;
    if (served(shape, kGeneralSparse)) {
      EXPECT_EQ(bits(trace_of(other, trees)), 0U) << name_of(shape);
    }
    if (served(kGeneralSparse, shape)) {
      EXPECT_EQ(bits(trace_of(trees, other)), 0U) << name_of(shape);
    }
  }
  SmMatrix* narrow = new_sized(session(), kGeneralSparse, 4, 2);
  EXPECT_EQ(trace_of(filled(session(), kDiagonalRows, 4, 4, random).matrix, narrow), 0.0);
}

TEST_P(ProductTrace, two_sparse_matrices_pass_over_what_the_second_has_as_zero) {
  for (const double odd : {kInfinity, kNan}) {
    SmMatrix* a =
        filled_with(session(), kSymmetricSparse, 3, 3, {{{0, 0}, 1.0}, {{0, 1}, odd}, {{0, 2}, odd}, {{1, 2}, 3.0}})
            .matrix;
    SmMatrix* b = filled_with(session(), kSymmetricSparse, 3, 3, {{{0, 0}, 2.0}, {{0, 1}, 0.0}, {{1, 2}, 5.0}}).matrix;
    EXPECT_EQ(trace_of(a, b), 2.0 + 2.0 * 15.0);
    const double other_way = trace_of(b, a);
    EXPECT_NE(other_way, other_way) << "a stored zero of the first times " << odd;
  }
}

INSTANTIATE_BOTH_HOSTS(ProductTrace);

}  // namespace
}  // namespace sm::test
