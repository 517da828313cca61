// qxsminvquad: X A^- X' for every served pair and every result.
#include <cmath>

#include "forms/inverses.hpp"

namespace sm::test {
namespace {

class InverseQuadTest : public FormsTest {
 protected:
  // A matrix whose inverse is known to the bit: 1/4 on the diagonal.
  SmMatrix* quarter(Shape shape, std::int64_t n) {
    Known known(n, n);
    for (std::int64_t i = 0; i < n; ++i) known.set(i, i, 4.0);
    return build(shape, known);
  }
};
INSTANTIATE_BOTH_HOSTS(InverseQuadTest);

TEST_P(InverseQuadTest, is_the_form_of_the_inverse_for_every_pair_and_result) {
  Random random(1);
  for (const Operand& operand : symmetric_and_diagonal())
    for (const Shape outer : kGeneralShapes)
      for (const Shape shape : kSymmetricShapes)
        for (const auto& [rows, n] :
             {std::pair{1, 1}, std::pair{1, 4}, std::pair{3, 4}, std::pair{6, 4}, std::pair{3, 17}}) {
          if (!solvable(operand)) continue;
          SCOPED_TRACE(name_of(operand) + " between " + name_of(outer) + " into " + name_of(shape));
          const Known known_a = random_known(random, operand.shape, n, n);
          const Known known_x = random_known(random, outer, rows, n);
          SmMatrix* a = build(operand, known_a);
          SmMatrix* x = build(outer, known_x);
          SmMatrix* r = build(shape, random_known(random, shape, 2, 2));
          const std::int64_t loose = host().live_blocks() - blocks_of(a) - blocks_of(r);
          ASSERT_EQ(fn().qxsminvquad(a, x, r), SM_OK);
          const Dense want = product(product(known_x.dense(), inverse(known_a.dense())), transposed(known_x.dense()));
          EXPECT_TRUE(near(read(r).dense(), want, 1e-12));
          EXPECT_EQ(r->state, SM_STATE_CLOSED);
          EXPECT_EQ(a->state, std::max<std::int32_t>(operand.state, SM_STATE_FACTORED));
          EXPECT_TRUE(same(read(a), known_a));
          EXPECT_TRUE(same_entries(read(x), known_x));
          EXPECT_EQ(host().live_blocks() - blocks_of(a) - blocks_of(r), loose);
          for (SmMatrix* m : {a, x, r}) destroy(m);
        }
}

TEST_P(InverseQuadTest, in_the_range_of_a_singular_matrix_is_the_form_of_the_matrix) {
  for (std::uint64_t seed = 0; seed < 8; ++seed) {
    Random random(seed);
    const Semidefinite s = cross_product(random, 1 + random.below(5), 1 + random.below(3), random.below(3));
    const Dense a = s.problem.dense();
    const std::int64_t n = s.problem.n;
    const std::vector<double> z = random.vector(2 * n);
    const Dense rows = transposed(product(a, columns(z, n)));
    const Dense want = product(rows, columns(z, n));
    Known known(2, n);
    for (std::int64_t r = 0; r < 2; ++r)
      for (std::int64_t c = 0; c < n; ++c) known.set(r, c, static_cast<double>(rows(r, c)));
    for (const Shape outer : kGeneralShapes)
      for (SmMatrix* m : {new_sparse(session(), s.problem), new_packed(session(), s.problem, SM_FORMAT_COLUMNS),
                          new_packed(session(), s.problem, SM_FORMAT_ROWS)}) {
        SmMatrix* r = typed(kSymmetricRows);
        ASSERT_EQ(fn().qxsminvquad(m, build(outer, known), r), SM_OK);
        EXPECT_TRUE(near(read(r).dense(), want, 1e-10)) << "seed " << seed;
      }
  }
}

TEST_P(InverseQuadTest, a_dropped_diagonal_element_counts_0) {
  for (const Shape shape : {kDiagonalColumns, kDiagonalRows})
    for (const Shape outer : kGeneralShapes) {
      Known known(3, 3);
      known.set(0, 0, 4.0);
      known.set(1, 1, 0.0);
      known.set(2, 2, 16.0);
      SmMatrix* r = typed(kSymmetricRows);
      ASSERT_EQ(fn().qxsminvquad(build(shape, known), build(outer, Known::full({{2, 5, 8}, {0, 7, 0}})), r), SM_OK);
      EXPECT_TRUE(same(read(r), Known::full({{5, 0}, {0, 0}}))) << name_of(outer);
    }
}

TEST_P(InverseQuadTest, a_sparse_x_enters_every_element_zeros_and_nans_too) {
  for (const Shape shape : kInvertible) {
    SCOPED_TRACE(name_of(shape));
    Known x(3, 3);
    x.set(0, 0, 2.0);
    x.set(1, 1, 1e-90);  // row 2 has no entries
    SmMatrix* r = typed(kSymmetricSparse);
    ASSERT_EQ(fn().qxsminvquad(quarter(shape, 3), build(kGeneralSparse, x), r), SM_OK);
    EXPECT_EQ(r->nnz, 6);
    EXPECT_EQ(read(r)(0, 0), 1.0);
    EXPECT_NEAR(read(r)(1, 1) / 0.25e-180, 1.0, 1e-12);
    EXPECT_EQ(read(r).count(), 9);
    x.set(1, 1, kNan);
    ASSERT_EQ(fn().qxsminvquad(quarter(shape, 3), build(kGeneralSparse, x), r), SM_OK);
    EXPECT_EQ(read(r)(0, 0), 1.0);
    EXPECT_TRUE(std::isnan(read(r)(1, 1)));
  }
}

TEST_P(InverseQuadTest, a_dense_x_enters_what_is_above_the_default_tolerance) {
  const double t = instance()->tolerances[3];
  Known one(1, 1);
  one.set(0, 0, 1.0);
  for (const Shape shape : kInvertible)
    for (const Shape outer : {kGeneralColumns, kGeneralRows})
      for (const auto& [value, entered] :
           {std::pair{t, false}, std::pair{-t, false}, std::pair{std::nextafter(t, 1.0), true}, std::pair{0.0, false},
            std::pair{kNan, false}, std::pair{kInfinity, true}}) {
        SCOPED_TRACE(name_of(shape) + " between " + name_of(outer) + ": " + std::to_string(value / t));
        SmMatrix* x = build(outer, Known::full({{1.0}, {value}}));
        SmMatrix* sparse = typed(kSymmetricSparse);
        ASSERT_EQ(fn().qxsminvquad(build(shape, one), x, sparse), SM_OK);
        EXPECT_TRUE(same(read(sparse)(0, 1), entered ? value : 0.0));
        EXPECT_EQ(read(sparse).has(0, 1), entered);
        SmMatrix* by_rows = typed(kSymmetricRows);
        ASSERT_EQ(fn().qxsminvquad(build(shape, one), x, by_rows), SM_OK);
        EXPECT_TRUE(same(read(by_rows)(0, 1), entered ? value : 0.0));
        SmMatrix* by_columns = typed(kSymmetricColumns);
        ASSERT_EQ(fn().qxsminvquad(build(shape, one), x, by_columns), SM_OK);
        EXPECT_TRUE(same(read(by_columns)(0, 1), value)) << "written as a whole";
      }
}

TEST_P(InverseQuadTest, the_result_is_sized_whatever_it_was) {
  Random random(2);
  for (const Operand& before : kSymmetricOperands)
    for (const Shape outer : kGeneralShapes)
      for (const std::int64_t n : {2, 5}) {
        SCOPED_TRACE(name_of(before) + " for " + name_of(outer));
        SmMatrix* r = build(before, random_known(random, before.shape, n, n));
        ASSERT_EQ(fn().qxsminvquad(quarter(kSymmetricRows, 2), build(outer, Known::full({{2, 0}, {0, 4}})), r), SM_OK);
        EXPECT_EQ(r->rows, 2);
        EXPECT_EQ(r->state, SM_STATE_CLOSED);
        EXPECT_TRUE(same(read(r), Known::full({{1, 0}, {0, 4}})));
        expect_voided(r);
        if (!is_sparse(before.shape)) {
          EXPECT_EQ(r->dense_factor, nullptr);
        }
        destroy(r);
      }
}

TEST_P(InverseQuadTest, an_open_result_is_closed) {
  for (const Shape outer : kGeneralShapes) {
    SmMatrix* r = sized(kSymmetricSparse, 7);
    ASSERT_EQ(fn().qxsmassign(r, 0, 1, 0, 99.0), SM_OK);
    ASSERT_EQ(fn().qxsminvquad(quarter(kSymmetricSparse, 2), build(outer, Known::full({{2, 0}, {2, 4}})), r), SM_OK);
    EXPECT_EQ(r->state, SM_STATE_CLOSED);
    EXPECT_TRUE(same(read(r), Known::full({{1, 1}, {1, 5}})));
  }
}

}  // namespace
}  // namespace sm::test
