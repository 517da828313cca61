// qxsmquad: X A X' for every pair of kinds and formats and every result.
#include <cmath>

#include "forms/forms_support.hpp"

namespace sm::test {
namespace {

class QuadTest : public FormsTest {
 protected:
  // The form of both into every result, sized first and added to what is there.
  void expect_form(SmMatrix* a, SmMatrix* x, const Known& want, bool whole);
  // The form of random rows, n long, around a random matrix.
  void expect_pair(Operand middle, Operand outer, std::int64_t rows, std::int64_t n, Random& random);
};
INSTANTIATE_BOTH_HOSTS(QuadTest);

// Element (i, j) and its mirror image are x_i A x_j' for i <= j.
Known form_of_rows(const Known& a, const Known& x) {
  Known r(x.rows(), x.rows());
  for (std::int64_t j = 0; j < x.rows(); ++j)
    for (std::int64_t i = 0; i <= j; ++i) r.set_both(i, j, form(a, x.row(i).data(), x.row(j).data()));
  return r;
}

bool dense_general(Shape shape) { return shape == kGeneralColumns || shape == kGeneralRows; }

void QuadTest::expect_form(SmMatrix* a, SmMatrix* x, const Known& want, bool whole) {
  Random random(9);
  const std::int64_t n = want.rows();
  for (const Shape shape : kSymmetricShapes) {
    SCOPED_TRACE("into " + name_of(shape));
    SmMatrix* r = build(shape, random_known(random, shape, n + 1, n + 1));
    ASSERT_EQ(fn().qxsmquad(a, x, r, 0), SM_OK);
    EXPECT_EQ(r->state, SM_STATE_CLOSED);
    EXPECT_TRUE(same(read(r), want));
    destroy(r);

    const Known before = random_known(random, shape, n, n);
    SmMatrix* kept = sized(shape, n);
    for (std::int64_t i = 0; i < n; ++i)
      for (std::int64_t j = i; j < n; ++j)
        if (before.has(i, j)) {
          ASSERT_EQ(fn().qxsmassign(kept, i, j, 0, before(i, j)), SM_OK);
        }
    ASSERT_EQ(fn().qxsmquad(a, x, kept, 0x10000), SM_OK);
    EXPECT_EQ(kept->state, is_sparse(shape) ? SM_STATE_OPEN : SM_STATE_CLOSED);
    EXPECT_TRUE(same(read(kept), whole && shape == kSymmetricColumns ? want : sum(before, want)));
    destroy(kept);
  }
}

void QuadTest::expect_pair(Operand middle, Operand outer, std::int64_t rows, std::int64_t n, Random& random) {
  SCOPED_TRACE(name_of(middle) + " of order " + std::to_string(n) + " between " + std::to_string(rows) + " rows of " +
               name_of(outer));
  const Known known_a = random_known(random, middle.shape, n, n);
  const Known known_x = random_known(random, outer.shape, rows, n);
  SmMatrix* a = build(middle, known_a);
  SmMatrix* x = build(outer, known_x);
  expect_form(a, x, form_of_rows(known_a, known_x), dense_general(outer.shape));
  EXPECT_TRUE(same_entries(read(a), known_a));
  EXPECT_TRUE(same_entries(read(x), known_x));
  EXPECT_EQ(a->state, middle.state);
  EXPECT_EQ(x->state, outer.state);
  destroy(a);
  destroy(x);
}

TEST_P(QuadTest, a_dense_x_is_served_for_every_middle_matrix) {
  Random random(1);
  for (const Operand& middle : all_operands())
    for (const Shape outer : {kGeneralColumns, kGeneralRows})
      for (const std::int64_t n : {1, 4})
        for (const std::int64_t rows : {1, 3, 6}) expect_pair(middle, {outer}, rows, n, random);
}

TEST_P(QuadTest, a_sparse_x_is_served_for_a_symmetric_matrix) {
  Random random(2);
  for (const Operand& middle : kSymmetricOperands)
    for (const std::int64_t n : {1, 4})
      for (const std::int64_t rows : {1, 3, 6}) expect_pair(middle, {kGeneralSparse}, rows, n, random);
}

TEST_P(QuadTest, a_symmetric_or_diagonal_x_is_read_by_rows_for_a_symmetric_matrix) {
  Random random(3);
  for (const Operand& middle : kSymmetricOperands)
    for (const Operand& outer : symmetric_and_diagonal()) {
      if (outer.shape == kSymmetricSparse && outer.state > SM_STATE_ORDERED) continue;  // 118
      expect_pair(middle, outer, 5, 5, random);
    }
}

TEST_P(QuadTest, a_matrix_may_stand_on_all_three_places) {
  Random random(4);
  for (const Operand& operand : {Operand{kSymmetricSparse}, Operand{kSymmetricSparse, SM_STATE_ORDERED},
                                 Operand{kSymmetricColumns}, Operand{kSymmetricRows, SM_STATE_FACTORED}}) {
    const Known known = random_known(random, operand.shape, 4, 4);
    SmMatrix* a = build(operand, known);
    expect_form(a, a, form_of_rows(known, known), false);
  }
  for (const Shape shape : {kGeneralColumns, kGeneralRows}) {
    const Known known = random_known(random, shape, 4, 4);
    SmMatrix* a = build(shape, known);
    expect_form(a, a, form_of_rows(known, known), true);
  }
}

TEST_P(QuadTest, longer_rows_are_summed_whole) {
  Random random(5);
  for (const std::int64_t n : {8, 17, 33})
    for (const Operand& operand : kSymmetricOperands)
      for (const Shape shape : kGeneralShapes) {
        const Known known_a = random_known(random, operand.shape, n, n);
        const Known known_x = random_known(random, shape, 4, n);
        SmMatrix* a = build(operand, known_a);
        SmMatrix* x = build(shape, known_x);
        SmMatrix* r = typed(kSymmetricRows);
        ASSERT_EQ(fn().qxsmquad(a, x, r, 0), SM_OK);
        EXPECT_TRUE(same(read(r), form_of_rows(known_a, known_x))) << name_of(operand) << ' ' << name_of(shape);
      }
}

TEST_P(QuadTest, rows_without_entries_give_a_form_of_zeros) {
  Random random(6);
  for (const Operand& operand : kSymmetricOperands) {
    SmMatrix* a = build(operand, random_known(random, operand.shape, 4, 4));
    SmMatrix* x = sized(kGeneralSparse, 3, 4);
    expect_form(a, x, Known(3, 3), false);
  }
}

// Of one row, x = 1: the form is the element of the middle matrix.
struct Threshold {
  double value;
  bool entered;
};

TEST_P(QuadTest, values_up_to_the_default_tolerance_are_not_entered) {
  const double t = instance()->tolerances[3];
  for (const Threshold& c : {Threshold{t, false}, Threshold{-t, false}, Threshold{std::nextafter(t, 1.0), true},
                             Threshold{-std::nextafter(t, 1.0), true}, Threshold{0.0, false}, Threshold{kNan, false},
                             Threshold{kInfinity, true}, Threshold{-kInfinity, true}})
    for (const Shape middle : kSymmetricShapes)
      for (const Shape outer : kGeneralShapes) {
        SCOPED_TRACE(name_of(middle) + " between " + name_of(outer) + ": " + std::to_string(c.value / t));
        Known known_a(2, 2);
        known_a.set(0, 0, 3.0);
        known_a.set(1, 1, c.value);
        Known known_x(2, 2);  // row 1 has the value alone
        known_x.set(0, 0, 0.0);
        known_x.set(1, 1, 1.0);
        if (outer != kGeneralSparse) {
          known_x.set(0, 1, 0.0);
          known_x.set(1, 0, 0.0);
        }
        if (!std::isfinite(c.value)) known_x.set(0, 1, 1.0);  // no zero meets it
        SmMatrix* a = build(middle, known_a);
        SmMatrix* x = build(outer, known_x);
        for (const Shape shape : {kSymmetricSparse, kSymmetricRows}) {
          SmMatrix* r = sized(shape, 2);
          ASSERT_EQ(fn().qxsmassign(r, 1, 1, 0, 0.0), SM_OK);
          ASSERT_EQ(fn().qxsmquad(a, x, r, 1), SM_OK);
          EXPECT_TRUE(same(read(r)(1, 1), c.entered ? c.value : 0.0)) << "into " << name_of(shape);
        }
        SmMatrix* r = typed(kSymmetricColumns);
        ASSERT_EQ(fn().qxsmquad(a, x, r, 0), SM_OK);
        const bool whole = dense_general(outer);
        EXPECT_TRUE(same(read(r)(1, 1), c.entered || whole ? c.value : 0.0));
      }
}

TEST_P(QuadTest, a_form_below_the_tolerance_leaves_a_sparse_result_without_entries_and_a_packed_one_whole) {
  const double tiny = 1e-160;
  SmMatrix* a = build(kSymmetricSparse, Known::full({{tiny, tiny}, {tiny, tiny}}));
  for (const Shape shape : kGeneralShapes) {
    SmMatrix* x = build(shape, Known::full({{1.0, 0.0}, {0.0, 1.0}}));
    SmMatrix* sparse = typed(kSymmetricSparse);
    ASSERT_EQ(fn().qxsmquad(a, x, sparse, 0), SM_OK);
    EXPECT_EQ(sparse->state, SM_STATE_CLOSED);
    EXPECT_EQ(sparse->nnz, 2);  // the diagonal
    EXPECT_TRUE(same(read(sparse), Known(2, 2)));
    SmMatrix* by_rows = typed(kSymmetricRows);
    ASSERT_EQ(fn().qxsmquad(a, x, by_rows, 0), SM_OK);
    EXPECT_TRUE(same(read(by_rows), Known(2, 2)));
    SmMatrix* by_columns = typed(kSymmetricColumns);
    ASSERT_EQ(fn().qxsmquad(a, x, by_columns, 0), SM_OK);
    EXPECT_TRUE(same(read(by_columns), dense_general(shape) ? Known::full({{tiny, tiny}, {tiny, tiny}}) : Known(2, 2)));
  }
}

TEST_P(QuadTest, what_a_sparse_x_does_not_store_counts_as_0_against_an_infinity) {
  for (const Shape middle : kSymmetricShapes) {
    SmMatrix* a = build(middle, Known::full({{kInfinity, 0.0}, {0.0, 2.0}}));
    Known known_x(2, 2);
    known_x.set(0, 0, 1.0);  // row 0 meets the infinity
    known_x.set(1, 1, 1.0);  // row 1 does with a zero that is not stored
    SmMatrix* r = typed(kSymmetricRows);
    ASSERT_EQ(fn().qxsmquad(a, build(kGeneralSparse, known_x), r, 0), SM_OK);
    EXPECT_EQ(read(r)(1, 1), 0.0) << "a NaN is not entered";
    known_x.set(0, 1, 1.0);
    known_x.set(1, 0, 1.0);
    ASSERT_EQ(fn().qxsmquad(a, build(kGeneralSparse, known_x), r, 0), SM_OK);
    EXPECT_EQ(read(r)(1, 1), kInfinity);
  }
}

}  // namespace
}  // namespace sm::test
