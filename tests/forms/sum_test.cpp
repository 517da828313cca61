// The sum of two matrices, C <- A + s B: qxsmvaxpy.
#include <gtest/gtest.h>

#include "forms/forms_support.hpp"

namespace sm::test {
namespace {

Known scaled(const Known& b, double s) {
  Known out(b.rows(), b.cols());
  for (std::int64_t r = 0; r < b.rows(); ++r)
    for (std::int64_t c = 0; c < b.cols(); ++c)
      if (b.has(r, c)) out.set(r, c, s * b(r, c));
  return out;
}

bool converts(Shape a, Shape c) {
  if (a.kind == SM_KIND_DIAGONAL) return true;
  return a.kind == SM_KIND_SYMMETRIC ? c.kind != SM_KIND_DIAGONAL : c.kind == SM_KIND_GENERAL;
}

// What adding B to C answers, C having taken A.
SmStatus adding(Shape a, Shape b, Shape c) {
  if (c.kind == SM_KIND_GENERAL) return c == kGeneralSparse && b == kGeneralSparse ? SM_OK : SM_UNAVAILABLE;
  if (c.kind == SM_KIND_DIAGONAL) return b.kind == SM_KIND_DIAGONAL ? SM_OK : SM_UNAVAILABLE;
  if (b.kind == SM_KIND_GENERAL) return SM_UNAVAILABLE;
  return c == kSymmetricSparse && !(a == kSymmetricSparse) ? SM_ALREADY_CLOSED : SM_OK;
}

class Sum : public FormsTest {
 protected:
  Known known(Random& random, Shape shape, std::int64_t n = 6) { return random_known(random, shape, n, n); }

  // All that the call must answer and leave, for one triple.
  void expect_sum(Operand oa, Operand ob, Shape sc, Random& random) {
    SCOPED_TRACE(name_of(sc) + " <- " + name_of(oa) + " + s " + name_of(ob));
    const Known a = known(random, oa.shape);
    const Known b = known(random, ob.shape);
    SmMatrix* ma = build(oa, a);
    SmMatrix* mb = build(ob, b);
    SmMatrix* mc = typed(sc);
    const SmStatus status = fn().qxsmvaxpy(mc, ma, mb, -0.75, 0.0);
    if (!converts(oa.shape, sc)) {
      EXPECT_EQ(status, SM_UNAVAILABLE);
      EXPECT_TRUE(same(read(mc), Known(6, 6))) << "sized only";
    } else {
      const SmStatus expected = adding(oa.shape, ob.shape, sc);
      EXPECT_EQ(status, expected);
      const Known want = expected == SM_OK ? sum(a, scaled(b, -0.75)) : a;
      EXPECT_TRUE(same(read(mc), want));
      if (is_sparse(sc) && expected == SM_OK) {
        EXPECT_TRUE(same_entries(read(mc), want));
      }
      const bool open = sc == kSymmetricSparse && oa.shape == kSymmetricSparse;
      EXPECT_EQ(mc->state, open ? SM_STATE_OPEN : SM_STATE_CLOSED);
    }
    EXPECT_TRUE(same(read(ma), a));
    EXPECT_TRUE(same(read(mb), b));
    EXPECT_EQ(ma->state, oa.state);
    EXPECT_EQ(mb->state, ob.state);
    for (SmMatrix* m : {ma, mb, mc}) destroy(m);
  }
};

TEST_P(Sum, every_triple_of_shapes_in_every_state_of_the_operands_is_added_or_refused) {
  Random random(1);
  for (const Operand oa : all_operands())
    for (const Operand ob : all_operands())
      for (const Shape sc : kShapes) expect_sum(oa, ob, sc, random);
}

TEST_P(Sum, sparse_matrices_that_are_not_square_are_added) {
  Random random(2);
  for (const auto& [rows, cols] : {std::pair<std::int64_t, std::int64_t>{3, 9}, {9, 3}, {1, 40}, {40, 1}})
    for (const Shape sa : kGeneralShapes) {
      const Known a = random_known(random, sa, rows, cols);
      const Known b = random_known(random, kGeneralSparse, rows, cols);
      SmMatrix* c = typed(kGeneralSparse);
      EXPECT_EQ(fn().qxsmvaxpy(c, build(sa, a), build(kGeneralSparse, b), 2.0, 0.0), SM_OK);
      EXPECT_TRUE(same_entries(read(c), sum(a, scaled(b, 2.0)))) << name_of(sa);
    }
}

TEST_P(Sum, every_scale_multiplies_every_entry_also_0_and_what_is_not_finite) {
  const Known a = Known::full({{1.0, 2.0}, {2.0, 4.0}});
  const Known b = Known::full({{8.0, 16.0}, {16.0, 32.0}});
  for (const Shape shape : {kGeneralSparse, kSymmetricSparse, kSymmetricColumns, kSymmetricRows}) {
    for (const double s : {1.0, 0.0, -1.0, 0.015625, kNan, kInfinity, -kInfinity}) {
      SmMatrix* c = typed(shape);
      EXPECT_EQ(fn().qxsmvaxpy(c, build(shape, a), build(shape, b), s, 0.0), SM_OK);
      EXPECT_TRUE(same(read(c), sum(a, scaled(b, s)))) << name_of(shape) << " by " << s;
    }
  }
  for (const Shape shape : {kDiagonalColumns, kDiagonalRows}) {
    SmMatrix* c = typed(shape);
    const Known da = diagonal_part(a);
    const Known db = diagonal_part(b);
    EXPECT_EQ(fn().qxsmvaxpy(c, build(shape, da), build(shape, db), kNan, 0.0), SM_OK);
    EXPECT_TRUE(same(read(c), sum(da, scaled(db, kNan))));
  }
}

TEST_P(Sum, entries_at_or_below_a_tolerance_become_0_and_stay_stored) {
  const Known a = Known::full({{1.0, 0.25}, {0.25, -0.5}});
  const Known b = Known::full({{0.5, 0.25}, {0.25, 0.25}});
  for (const Shape shape : {kGeneralSparse, kSymmetricSparse, kSymmetricColumns, kSymmetricRows}) {
    SCOPED_TRACE(name_of(shape));
    const auto summed = [&](double tolerance) {
      SmMatrix* c = typed(shape);
      EXPECT_EQ(fn().qxsmvaxpy(c, build(shape, a), build(shape, b), -1.0, tolerance), SM_OK);
      EXPECT_EQ(c->nnz, shape.kind == SM_KIND_GENERAL ? 4 : 3) << "nothing is unlinked";
      return read(c);
    };
    EXPECT_TRUE(same_entries(summed(0.0), Known::full({{0.5, 0.0}, {0.0, -0.75}})));
    EXPECT_TRUE(same_entries(summed(0.5), Known::full({{0.0, 0.0}, {0.0, -0.75}}))) << "at the tolerance";
    EXPECT_TRUE(same_entries(summed(0.7), Known::full({{0.0, 0.0}, {0.0, -0.75}})));
    EXPECT_TRUE(same_entries(summed(8.0), Known::full({{0.0, 0.0}, {0.0, 0.0}})));
    EXPECT_TRUE(same_entries(summed(-1.0), Known::full({{0.5, 0.0}, {0.0, -0.75}}))) << "a negative one means none";
  }
}

TEST_P(Sum, a_nan_as_tolerance_is_the_default_one) {
  const double tiny = 1e-160;  // below setting 3
  const double small = 1e-150;
  for (const Shape shape : {kGeneralSparse, kSymmetricSparse, kSymmetricColumns, kSymmetricRows}) {
    const Known a = Known::full({{tiny, small}, {small, 1.0}});
    const Known b = Known::full({{0.0, 0.0}, {0.0, 0.0}});
    SmMatrix* c = typed(shape);
    EXPECT_EQ(fn().qxsmvaxpy(c, build(shape, a), build(shape, b), 1.0, kNan), SM_OK);
    EXPECT_TRUE(same(read(c), Known::full({{0.0, small}, {small, 1.0}}))) << name_of(shape);
    EXPECT_EQ(fn().qxsmvaxpy(c, build(shape, a), build(shape, b), 1.0, 0.0), SM_OK);
    EXPECT_TRUE(same(read(c), a)) << name_of(shape);
  }
}

TEST_P(Sum, a_result_loses_what_it_held) {
  Random random(3);
  for (const Operand held : all_operands()) {
    const Shape shape = held.shape;
    if (shape == kGeneralColumns || shape == kGeneralRows) continue;
    const Known a = known(random, shape);
    const Known b = known(random, shape);
    SmMatrix* c = build(held, known(random, shape, 9));
    ASSERT_EQ(fn().qxsmvaxpy(c, build(shape, a), build(shape, b), 0.5, 0.0), SM_OK) << name_of(held);
    EXPECT_TRUE(same(read(c), sum(a, scaled(b, 0.5)))) << name_of(held);
    EXPECT_EQ(c->state, shape == kSymmetricSparse ? SM_STATE_OPEN : SM_STATE_CLOSED) << name_of(held);
    expect_voided(c);
    if (!is_sparse(shape)) {
      EXPECT_EQ(c->dense_factor, nullptr);
    }
  }
}

TEST_P(Sum, an_open_result_is_closed_to_be_read_and_factored) {
  Random random(4);
  const Known a = known(random, kSymmetricSparse);
  const Known b = known(random, kSymmetricSparse);
  SmMatrix* c = typed(kSymmetricSparse);
  ASSERT_EQ(fn().qxsmvaxpy(c, build(kSymmetricSparse, a), build(kSymmetricSparse, b), 1.0, 0.0), SM_OK);
  double value = 0.0;
  EXPECT_EQ(fn().qxsmget(c, 0, 0, &value), SM_NOT_CLOSED);
  ASSERT_EQ(fn().qxsmclose(c, kNan), SM_OK);
  EXPECT_TRUE(same(read(c), sum(a, b)));
  ASSERT_EQ(fn().qxsmfact(c, 0), SM_OK);
  EXPECT_TRUE(near(solved_identity(c), inverse(sum(a, b).dense()), 1e-10));
}

TEST_P(Sum, a_matrix_may_be_both_operands) {
  Random random(5);
  for (const Operand o : all_operands()) {
    if (o.shape == kGeneralColumns || o.shape == kGeneralRows) continue;
    const Known a = known(random, o.shape);
    SmMatrix* m = build(o, a);
    SmMatrix* c = typed(o.shape);
    EXPECT_EQ(fn().qxsmvaxpy(c, m, m, 2.0, 0.0), SM_OK) << name_of(o);
    EXPECT_TRUE(same(read(c), scaled(a, 3.0))) << name_of(o);
    EXPECT_TRUE(same(read(m), a)) << name_of(o);
  }
}

TEST_P(Sum, a_first_operand_without_entries_gives_a_result_without) {
  Random random(6);
  const Known b = known(random, kGeneralSparse, 4);
  SmMatrix* c = build(kGeneralSparse, known(random, kGeneralSparse, 3));
  EXPECT_EQ(fn().qxsmvaxpy(c, sized(kGeneralSparse, 4), build(kGeneralSparse, b), 1.0, 0.0), SM_OK);
  EXPECT_EQ(c->rows, 4);
  EXPECT_EQ(c->nnz, 0);
  EXPECT_EQ(fn().qxsmvaxpy(c, build(kGeneralSparse, b), sized(kGeneralSparse, 4), 1.0, 0.0), SM_OK);
  EXPECT_TRUE(same_entries(read(c), b)) << "a second one without entries adds nothing";
}

// The first operand is the result: B is added to it where it stands.

TEST_P(Sum, a_result_that_is_the_first_operand_is_added_to_in_place) {
  Random random(7);
  for (const Operand oa : all_operands())
    for (const Operand ob : all_operands()) {
      SCOPED_TRACE(name_of(oa) + " += s " + name_of(ob));
      const Known a = known(random, oa.shape);
      const Known b = known(random, ob.shape);
      SmMatrix* ma = build(oa, a);
      SmMatrix* mb = build(ob, b);
      SmStatus expected = adding(kSymmetricSparse, ob.shape, oa.shape);
      if (expected == SM_OK && oa.shape == kSymmetricSparse) expected = SM_ALREADY_CLOSED;
      EXPECT_EQ(fn().qxsmvaxpy(ma, ma, mb, 0.25, 0.0), expected);
      EXPECT_TRUE(same(read(ma), expected == SM_OK ? sum(a, scaled(b, 0.25)) : a));
      EXPECT_TRUE(same(read(mb), b));
      EXPECT_EQ(ma->state, expected == SM_OK ? SM_STATE_CLOSED : oa.state);
      if (expected == SM_OK) expect_voided(ma);
      destroy(ma);
      destroy(mb);
    }
}

TEST_P(Sum, an_open_first_operand_is_added_to_when_it_is_the_result) {
  Random random(8);
  for (const Operand ob : all_operands()) {
    if (ob.shape.kind == SM_KIND_GENERAL) continue;
    const Known a = known(random, kSymmetricSparse);
    const Known b = known(random, ob.shape);
    SmMatrix* open = sized(kSymmetricSparse, 6);
    for (std::int64_t r = 0; r < 6; ++r)
      for (std::int64_t c = r; c < 6; ++c) {
        if (a.has(r, c)) {
          EXPECT_EQ(fn().qxsmassign(open, r, c, 0, a(r, c)), SM_OK);
        }
      }
    SmMatrix* other = typed(kSymmetricSparse);
    EXPECT_EQ(fn().qxsmvaxpy(other, open, build(ob, b), 0.5, 0.0), SM_NOT_CLOSED) << "else it must be closed";
    EXPECT_EQ(fn().qxsmvaxpy(open, open, build(ob, b), 0.5, 0.0), SM_OK) << name_of(ob);
    EXPECT_EQ(open->state, SM_STATE_OPEN);
    EXPECT_TRUE(same_entries(read(open), sum(a, scaled(b, 0.5)))) << name_of(ob);
  }
}

TEST_P(Sum, shapes_are_not_compared_when_the_first_operand_is_the_result) {
  Random random(9);
  const Known a = random_known(random, kGeneralSparse, 3, 4);
  const Known b = random_known(random, kGeneralSparse, 7, 9);
  SmMatrix* ma = build(kGeneralSparse, a);
  SmMatrix* mb = build(kGeneralSparse, b);
  EXPECT_EQ(fn().qxsmvaxpy(typed(kGeneralSparse), ma, mb, 2.0, 0.0), SM_DIMENSION_MISMATCH);
  EXPECT_EQ(fn().qxsmvaxpy(ma, ma, mb, 2.0, 0.0), SM_OK);
  double value = 0.0;
  for (std::int64_t r = 0; r < 7; ++r)
    for (std::int64_t c = 0; c < 9; ++c) {
      if (r >= ma->rows || c >= ma->cols) {
        EXPECT_FALSE(b.has(r, c)) << "the matrix grows to cover what is entered";
        continue;
      }
      EXPECT_EQ(fn().qxsmget(ma, r, c, &value), SM_OK);
      EXPECT_EQ(value, (r < 3 && c < 4 ? a(r, c) : 0.0) + 2.0 * b(r, c)) << r << ' ' << c;
    }
}

INSTANTIATE_BOTH_HOSTS(Sum);

}  // namespace
}  // namespace sm::test
