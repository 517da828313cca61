// qxsminvquadv and qxsminvbilin: forms of vectors around the inverse.
#include <cmath>

#include "forms/inverses.hpp"

namespace sm::test {
namespace {

class InverseVectorFormsTest : public FormsTest {
 protected:
  SmStatus quadratic(SmMatrix* m, const std::vector<double>& x, Output& r, std::int64_t p, std::int32_t format) {
    return fn().qxsminvquadv(m, x.data(), r.data(), p, format);
  }
  static SmStatus bilinear(SmMatrix* m, const std::vector<double>& x, const std::vector<double>& y, Output& r,
                           std::int64_t p, std::int64_t q) {
    return qxsminvbilin(m, x.data(), y.data(), r.data(), p, q);
  }
};
INSTANTIATE_BOTH_HOSTS(InverseVectorFormsTest);

// X' G Y.
Dense form_in(const Dense& g, const std::vector<double>& x, const std::vector<double>& y) {
  return product(product(transposed(columns(x, g.rows())), g), columns(y, g.rows()));
}

Dense unpacked(const std::vector<double>& r, std::int64_t p, bool by_rows) {
  Dense d(p, p);
  std::size_t next = 0;
  for (std::int64_t outer = 0; outer < p; ++outer)
    for (std::int64_t inner = by_rows ? outer : 0; inner < (by_rows ? p : outer + 1); ++inner) {
      d(outer, inner) = r[next];
      d(inner, outer) = r[next++];
    }
  return d;
}

TEST_P(InverseVectorFormsTest, a_quadratic_form_is_that_of_the_inverse_in_both_layouts) {
  Random random(1);
  for (const Operand& operand : symmetric_and_diagonal())
    for (const std::int64_t n : {1, 3, 8, 17})
      for (const std::int64_t p : {1, 2, 5}) {
        if (!solvable(operand)) continue;
        SCOPED_TRACE(name_of(operand) + " of order " + std::to_string(n));
        const Known known = random_known(random, operand.shape, n, n);
        const std::vector<double> x = random.vector(n * p);
        const Dense want = form_in(inverse(known.dense()), x, x);
        for (const std::int32_t format : {23, 22, 21, 0, -23}) {
          SmMatrix* m = build(operand, known);
          const std::int64_t loose = host().live_blocks() - blocks_of(m);
          Output r(p * (p + 1) / 2);
          ASSERT_EQ(quadratic(m, x, r, p, format), SM_OK);
          EXPECT_TRUE(near(unpacked(r.values(), p, format == 23), want, 1e-12));
          EXPECT_EQ(m->state, std::max<std::int32_t>(operand.state, SM_STATE_FACTORED));
          EXPECT_TRUE(same(read(m), known));
          EXPECT_EQ(host().live_blocks() - blocks_of(m), loose);
          destroy(m);
        }
      }
}

TEST_P(InverseVectorFormsTest, three_vectors_lie_where_the_layout_puts_them) {
  Known d(3, 3);
  for (std::int64_t i = 0; i < 3; ++i) d.set(i, i, 1.0);
  SmMatrix* m = build(kDiagonalRows, d);
  const std::vector<double> x{1, 1, 1, 1, 2, 3, 2, -1, 5};
  Output by_rows(6);
  ASSERT_EQ(quadratic(m, x, by_rows, 3, 23), SM_OK);
  EXPECT_TRUE(same(by_rows.values(), {3.0, 6.0, 6.0, 14.0, 15.0, 30.0}));  // (0,0) (0,1) (0,2) (1,1) (1,2) (2,2)
  Output by_columns(6);
  ASSERT_EQ(quadratic(m, x, by_columns, 3, 22), SM_OK);
  EXPECT_TRUE(same(by_columns.values(), {3.0, 6.0, 14.0, 6.0, 15.0, 30.0}));  // (0,0) (0,1) (1,1) (0,2) (1,2) (2,2)
}

TEST_P(InverseVectorFormsTest, a_bilinear_form_is_that_of_the_inverse) {
  Random random(2);
  for (const Operand& operand : symmetric_and_diagonal())
    for (const std::int64_t n : {1, 4, 17})
      for (const auto& [p, q] : {std::pair{1, 1}, std::pair{1, 4}, std::pair{3, 1}, std::pair{3, 4}}) {
        if (!solvable(operand)) continue;
        SCOPED_TRACE(name_of(operand) + " of order " + std::to_string(n));
        const Known known = random_known(random, operand.shape, n, n);
        const std::vector<double> x = random.vector(n * p);
        const std::vector<double> y = random.vector(n * q);
        SmMatrix* m = build(operand, known);
        const std::int64_t loose = host().live_blocks() - blocks_of(m);
        Output r(std::vector<double>(at(p * q), kNan));
        ASSERT_EQ(bilinear(m, x, y, r, p, q), SM_OK);
        EXPECT_TRUE(near(columns(r.values(), p), form_in(inverse(known.dense()), x, y), 1e-12));
        EXPECT_EQ(m->state, std::max<std::int32_t>(operand.state, SM_STATE_FACTORED));
        EXPECT_TRUE(same(read(m), known));
        EXPECT_EQ(host().live_blocks() - blocks_of(m), loose);
        Output twice(p * p);
        ASSERT_EQ(bilinear(m, x, x, twice, p, p), SM_OK);
        EXPECT_TRUE(near(columns(twice.values(), p), form_in(inverse(known.dense()), x, x), 1e-12));
        destroy(m);
      }
}

// For x = A z every generalized inverse gives z' A z.
TEST_P(InverseVectorFormsTest, in_the_range_of_a_singular_matrix_the_form_is_that_of_the_matrix) {
  for (std::uint64_t seed = 0; seed < 10; ++seed) {
    Random random(seed);
    const Semidefinite s = cross_product(random, 1 + random.below(6), 1 + random.below(4), random.below(3));
    const Dense a = s.problem.dense();
    const std::int64_t n = s.problem.n;
    std::vector<double> z;
    std::vector<double> x;
    for (int v = 0; v < 2; ++v) {
      const std::vector<double> one = random.vector(n);
      const std::vector<double> image = product(a, one);
      z.insert(z.end(), one.begin(), one.end());
      x.insert(x.end(), image.begin(), image.end());
    }
    const Dense want = form_in(a, z, z);
    for (SmMatrix* m : {new_sparse(session(), s.problem), new_packed(session(), s.problem, SM_FORMAT_COLUMNS),
                        new_packed(session(), s.problem, SM_FORMAT_ROWS)}) {
      Output r(3);
      ASSERT_EQ(quadratic(m, x, r, 2, 22), SM_OK);
      EXPECT_TRUE(near(unpacked(r.values(), 2, false), want, 1e-10)) << "seed " << seed;
      Output t(4);
      ASSERT_EQ(bilinear(m, x, x, t, 2, 2), SM_OK);
      EXPECT_TRUE(near(columns(t.values(), 2), want, 1e-10)) << "seed " << seed;
      EXPECT_EQ(m->rank, s.rank);
    }
  }
}

TEST_P(InverseVectorFormsTest,
       a_dropped_diagonal_element_counts_0_in_the_solve_and_is_divided_by_in_the_bilinear_form) {
  for (const Shape shape : {kDiagonalColumns, kDiagonalRows}) {
    Known d(3, 3);
    d.set(0, 0, 4.0);
    d.set(1, 1, 0.0);
    d.set(2, 2, 16.0);
    SmMatrix* m = build(shape, d);
    const std::vector<double> x{2.0, 5.0, 8.0};
    Output r(1);
    ASSERT_EQ(quadratic(m, x, r, 1, 22), SM_OK);
    EXPECT_EQ(r.values()[0], 1.0 + 4.0);
    ASSERT_EQ(bilinear(m, x, x, r, 1, 1), SM_OK);
    EXPECT_EQ(r.values()[0], kInfinity);
    ASSERT_EQ(bilinear(m, x, {1.0, -1.0, 1.0}, r, 1, 1), SM_OK);
    EXPECT_EQ(r.values()[0], -kInfinity);
    ASSERT_EQ(bilinear(m, x, {1.0, 0.0, 1.0}, r, 1, 1), SM_OK);
    EXPECT_TRUE(std::isnan(r.values()[0]));
    ASSERT_EQ(fn().qxsminv(m, 0, kNan), SM_OK);  // in an inverse it is a plain 0
    ASSERT_EQ(bilinear(m, x, x, r, 1, 1), SM_OK);
    EXPECT_EQ(r.values()[0], 1.0 + 4.0);
  }
}

TEST_P(InverseVectorFormsTest, a_diagonal_form_reads_the_separate_array) {
  Known d(2, 2);
  d.set(0, 0, 4.0);
  d.set(1, 1, 16.0);
  const std::vector<double> x{1.0, 3.0};
  for (const Shape shape : {kDiagonalColumns, kDiagonalRows}) {
    SmMatrix* m = build({shape, SM_STATE_FACTORED}, d);
    m->dense_factor[0] = 0.5;
    m->dense_factor[1] = 0.25;
    Output r(1);
    ASSERT_EQ(bilinear(m, x, x, r, 1, 1), SM_OK);
    EXPECT_EQ(r.values()[0], 4.0 + 9.0 * 16.0);
    m->state = SM_STATE_INVERTED;
    ASSERT_EQ(bilinear(m, x, x, r, 1, 1), SM_OK);
    EXPECT_EQ(r.values()[0], 0.5 + 9.0 * 0.25);
    ASSERT_EQ(quadratic(m, x, r, 1, 23), SM_OK);
    EXPECT_EQ(r.values()[0], 0.5 + 9.0 * 0.25);
  }
}

TEST_P(InverseVectorFormsTest, without_vectors_the_matrix_is_factored_and_nothing_written) {
  Random random(3);
  for (const Operand& operand : symmetric_and_diagonal()) {
    if (!solvable(operand)) continue;
    SCOPED_TRACE(name_of(operand));
    const std::vector<double> x(16, 1.0);
    const Known known = random_known(random, operand.shape, 4, 4);
    const std::int32_t then = std::max<std::int32_t>(operand.state, SM_STATE_FACTORED);
    for (const std::int64_t none : {std::int64_t{0}, std::int64_t{-1}, std::int64_t{-3}, kLeast}) {
      Output r(16);
      SmMatrix* m = build(operand, known);
      EXPECT_EQ(quadratic(m, x, r, none, 23), SM_OK) << none;
      EXPECT_EQ(m->state, then);
      EXPECT_TRUE(r.untouched());
      for (const auto& [p, q] :
           {std::pair{none, std::int64_t{2}}, std::pair{std::int64_t{2}, none}, std::pair{none, none}}) {
        SmMatrix* b = build(operand, known);
        EXPECT_EQ(bilinear(b, x, x, r, p, q), SM_OK) << p << ' ' << q;
        EXPECT_EQ(b->state, then);
        EXPECT_TRUE(r.untouched());
        destroy(b);
      }
      destroy(m);
    }
  }
}

// 1/4 on the diagonal: every order of a sum gives the same bits.
TEST_P(InverseVectorFormsTest, longer_vectors_are_summed_whole) {
  Random random(4);
  for (const std::int64_t n : {249, 250, 499, 500, 501})
    for (const Shape shape : {kSymmetricSparse, kSymmetricRows, kDiagonalColumns}) {
      Known known(n, n);
      for (std::int64_t i = 0; i < n; ++i) known.set(i, i, 4.0);
      SmMatrix* m = build(shape, known);
      const std::vector<double> x = random.vector(2 * n);
      std::vector<double> want(4);
      for (std::size_t e = 0; e < 4; ++e)
        for (std::int64_t i = 0; i < n; ++i)
          want[e] += x[at(i + n * (e % 2 ? 1 : 0))] * x[at(i + n * (e / 2 ? 1 : 0))] / 4.0;
      Output r(3);
      ASSERT_EQ(quadratic(m, x, r, 2, 22), SM_OK);
      EXPECT_TRUE(same(r.values(), {want[0], want[1], want[3]})) << name_of(shape) << ' ' << n;
      Output t(4);
      ASSERT_EQ(bilinear(m, x, x, t, 2, 2), SM_OK);
      EXPECT_TRUE(same(t.values(), want)) << name_of(shape) << ' ' << n;
      destroy(m);
    }
}

TEST_P(InverseVectorFormsTest, infinities_and_nans_of_the_vectors_propagate) {
  for (const Operand& operand : symmetric_and_diagonal()) {
    if (!solvable(operand)) continue;
    Known known(2, 2);
    known.set(0, 0, 4.0);
    known.set(1, 1, 4.0);
    SmMatrix* m = build(operand, known);
    const std::vector<double> x{1.0, 2.0, 1.0, kNan};
    Output r(3);
    ASSERT_EQ(quadratic(m, x, r, 2, 22), SM_OK);
    EXPECT_EQ(r.values()[0], 1.25) << name_of(operand);
    EXPECT_TRUE(std::isnan(r.values()[1]) && std::isnan(r.values()[2])) << name_of(operand);
    Output t(4);
    ASSERT_EQ(bilinear(m, x, x, t, 2, 2), SM_OK);
    EXPECT_EQ(t.values()[0], 1.25) << name_of(operand);
    for (const std::size_t i : {1U, 2U, 3U}) EXPECT_TRUE(std::isnan(t.values()[i])) << name_of(operand);
  }
}

}  // namespace
}  // namespace sm::test
