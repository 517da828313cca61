// qxsmquadv and qxsmbilin: forms of vectors around every kind of matrix.
#include <cmath>

#include "forms/forms_support.hpp"

namespace sm::test {
namespace {

class VectorFormsTest : public FormsTest {
 protected:
  SmStatus quadratic(SmMatrix* m, const std::vector<double>& x, Output& r, std::int64_t p, std::int64_t c0,
                     std::int64_t c1) {
    return fn().qxsmquadv(m, x.data(), r.data(), p, c0, c1);
  }
  SmStatus bilinear(SmMatrix* m, const std::vector<double>& x, const std::vector<double>& y, Output& r, std::int64_t p,
                    std::int64_t q) {
    return fn().qxsmbilin(m, x.data(), y.data(), r.data(), p, q);
  }
  void expect_every_range(Operand operand, const Known& known, std::int64_t p);
};
INSTANTIATE_BOTH_HOSTS(VectorFormsTest);

Known leading_block(const Known& a, std::int64_t c0, std::int64_t c1) {
  Known b(c1 - c0 + 1, c1 - c0 + 1);
  for (std::int64_t i = c0; i <= c1; ++i)
    for (std::int64_t j = c0; j <= c1; ++j)
      if (a.has(i, j)) b.set(i - c0, j - c0, a(i, j));
  return b;
}

// Element (a, b), a <= b, is x_a' A x_b, packed by columns.
std::vector<double> packed_form(const Known& a, const std::vector<double>& x, std::int64_t p) {
  std::vector<double> r;
  for (std::int64_t b = 0; b < p; ++b)
    for (std::int64_t c = 0; c <= b; ++c) r.push_back(form(a, &x[at(c * a.rows())], &x[at(b * a.rows())]));
  return r;
}

std::vector<double> full_form(const Known& a, const std::vector<double>& x, const std::vector<double>& y,
                              std::int64_t p, std::int64_t q) {
  std::vector<double> r;
  for (std::int64_t b = 0; b < q; ++b)
    for (std::int64_t c = 0; c < p; ++c) r.push_back(form(a, &x[at(c * a.rows())], &y[at(b * a.rows())]));
  return r;
}

void VectorFormsTest::expect_every_range(Operand operand, const Known& known, std::int64_t p) {
  Random random(static_cast<std::uint64_t>(p));
  SmMatrix* m = build(operand, known);
  for (std::int64_t c0 = 0; c0 < known.rows(); ++c0)
    for (std::int64_t c1 = c0; c1 < known.rows(); ++c1) {
      SCOPED_TRACE(name_of(operand) + ", " + std::to_string(c0) + " to " + std::to_string(c1));
      const std::vector<double> x = random.vector(p * (c1 - c0 + 1));
      Output r(p * (p + 1) / 2);
      ASSERT_EQ(quadratic(m, x, r, p, c0, c1), SM_OK);
      ASSERT_TRUE(same(r.values(), packed_form(leading_block(known, c0, c1), x, p)));
    }
  EXPECT_TRUE(same_entries(read(m), known));
  EXPECT_EQ(m->state, operand.state);
  destroy(m);
}

TEST_P(VectorFormsTest, a_quadratic_form_over_every_range_is_that_of_the_elements) {
  Random random(1);
  for (const Operand& operand : all_operands())
    for (const std::int64_t n : {1, 2, 6})
      for (const std::int64_t p : {1, 2, 5}) expect_every_range(operand, random_known(random, operand.shape, n, n), p);
}

TEST_P(VectorFormsTest, a_reordered_sparse_matrix_gives_every_range_of_the_caller) {
  for (std::uint64_t seed = 0; seed < 10; ++seed) {
    Random random(seed);
    const Known known = random_known(random, kSymmetricSparse, 9, 9);
    for (std::int32_t state = SM_STATE_CLOSED; state <= SM_STATE_FACTORED; ++state)
      expect_every_range({kSymmetricSparse, state}, known, 2);
  }
}

TEST_P(VectorFormsTest, every_length_around_a_lane_of_the_processor_is_summed_whole) {
  Random random(2);
  for (const std::int64_t n : {3, 7, 8, 9, 15, 16, 17, 31, 32, 33, 65})
    for (const Operand& operand : all_operands()) {
      SCOPED_TRACE(name_of(operand) + " of order " + std::to_string(n));
      const Known known = random_known(random, operand.shape, n, n);
      SmMatrix* m = build(operand, known);
      const std::vector<double> x = random.vector(3 * n);
      const std::vector<double> y = random.vector(2 * n);
      Output r(6);
      ASSERT_EQ(quadratic(m, x, r, 3, 0, n - 1), SM_OK);
      EXPECT_TRUE(same(r.values(), packed_form(known, x, 3)));
      if (operand.shape.kind != SM_KIND_GENERAL) {
        Output s(6);
        ASSERT_EQ(bilinear(m, x, y, s, 3, 2), SM_OK);
        EXPECT_TRUE(same(s.values(), full_form(known, x, y, 3, 2)));
      }
      destroy(m);
    }
}

TEST_P(VectorFormsTest, one_vector_writes_one_value) {
  for (const Shape shape : kShapes) {
    Known known(2, 2);
    known.set(0, 0, 3.0);
    known.set(1, 1, 5.0);
    if (shape.kind != SM_KIND_DIAGONAL) known.set_both(0, 1, 2.0);
    Output r(1);
    ASSERT_EQ(quadratic(build(shape, known), {1.0, 10.0}, r, 1, 0, 1), SM_OK);
    EXPECT_EQ(r.values()[0], shape.kind == SM_KIND_DIAGONAL ? 503.0 : 543.0) << name_of(shape);
  }
}

TEST_P(VectorFormsTest, of_a_general_matrix_the_first_vector_stands_on_the_left) {
  const Known known = Known::full({{0.0, 1.0}, {0.0, 0.0}});
  for (const Shape shape : kGeneralShapes) {
    Output r(3);
    ASSERT_EQ(quadratic(build(shape, known), {1.0, 0.0, 0.0, 1.0}, r, 2, 0, 1), SM_OK);
    EXPECT_TRUE(same(r.values(), {0.0, 1.0, 0.0})) << name_of(shape);  // e_0' A e_1, not e_1' A e_0
  }
}

TEST_P(VectorFormsTest, a_quadratic_form_is_written_not_added) {
  Random random(3);
  for (const Operand& operand : all_operands()) {
    const Known known = random_known(random, operand.shape, 4, 4);
    SmMatrix* m = build(operand, known);
    const std::vector<double> x = random.vector(8);
    Output r(std::vector<double>(3, kNan));
    ASSERT_EQ(quadratic(m, x, r, 2, 0, 3), SM_OK);
    EXPECT_TRUE(same(r.values(), packed_form(known, x, 2))) << name_of(operand);
    ASSERT_EQ(quadratic(m, x, r, 2, 0, 3), SM_OK);
    EXPECT_TRUE(same(r.values(), packed_form(known, x, 2))) << name_of(operand);
  }
}

TEST_P(VectorFormsTest, elements_outside_the_range_never_reach_a_quadratic_form) {
  Random random(4);
  for (const Operand& operand : all_operands()) {
    if (operand.state > SM_STATE_REORDERED) continue;  // what holds a NaN is not factored
    Known known = random_known(random, operand.shape, 6, 6);
    for (std::int64_t i = 0; i < 6; ++i)
      for (std::int64_t j = 0; j < 6; ++j)
        if (known.has(i, j) && (i < 2 || i > 4 || j < 2 || j > 4)) known.set(i, j, kNan);
    const std::vector<double> x = random.vector(6);
    Output r(3);
    ASSERT_EQ(quadratic(build(operand, known), x, r, 2, 2, 4), SM_OK);
    const std::vector<double> got = r.values();
    EXPECT_TRUE(same(got, packed_form(leading_block(known, 2, 4), x, 2))) << name_of(operand);
    for (const double v : got) EXPECT_FALSE(std::isnan(v));
  }
}

TEST_P(VectorFormsTest, an_infinity_or_nan_of_the_matrix_is_met_by_zeros_of_the_vectors) {
  for (const Operand& operand : all_operands()) {
    if (operand.state > SM_STATE_REORDERED) continue;
    SCOPED_TRACE(name_of(operand));
    for (const double special : {kInfinity, kNan}) {
      Known known(3, 3);
      for (std::int64_t i = 0; i < 3; ++i) known.set(i, i, 2.0);
      if (operand.shape.kind == SM_KIND_DIAGONAL) {
        known.set(1, 1, special);
      } else {
        known.set_both(0, 2, special);
      }
      SmMatrix* m = build(operand, known);
      const std::vector<double> zero(3, 0.0);
      const std::vector<double> ones(3, 1.0);
      Output r(1);
      ASSERT_EQ(quadratic(m, zero, r, 1, 0, 2), SM_OK);
      EXPECT_TRUE(std::isnan(r.values()[0]));
      ASSERT_EQ(quadratic(m, ones, r, 1, 0, 2), SM_OK);
      EXPECT_TRUE(same(r.values()[0], special));
      if (operand.shape.kind == SM_KIND_GENERAL) continue;
      ASSERT_EQ(bilinear(m, zero, ones, r, 1, 1), SM_OK);
      EXPECT_TRUE(std::isnan(r.values()[0]));
      ASSERT_EQ(bilinear(m, ones, ones, r, 1, 1), SM_OK);
      EXPECT_TRUE(same(r.values()[0], special));
    }
  }
}

TEST_P(VectorFormsTest, a_nan_of_one_vector_stays_with_its_own_elements) {
  Random random(5);
  for (const Operand& operand : all_operands()) {
    SCOPED_TRACE(name_of(operand));
    Known known = random_known(random, operand.shape, 4, 4);
    for (std::int64_t i = 0; i < 4; ++i) known.set(i, i, 100.0);  // no empty rows
    SmMatrix* m = build(operand, known);
    for (std::int64_t place = 0; place < 4; ++place) {
      std::vector<double> x = random.vector(12);
      x[at(4 + place)] = kNan;
      Output r(6);
      ASSERT_EQ(quadratic(m, x, r, 3, 0, 3), SM_OK);
      const std::vector<double> got = r.values();
      EXPECT_TRUE(same(got, packed_form(known, x, 3)));
      for (const std::size_t of_the_second : {1U, 2U, 4U}) EXPECT_TRUE(std::isnan(got[of_the_second]));
      for (const std::size_t of_others : {0U, 3U, 5U}) EXPECT_FALSE(std::isnan(got[of_others]));
      if (operand.shape.kind == SM_KIND_GENERAL) continue;
      Output s(6);
      ASSERT_EQ(bilinear(m, x, random.vector(8), s, 3, 2), SM_OK);
      for (std::size_t i = 0; i < 6; ++i) EXPECT_EQ(std::isnan(s.values()[i]), i % 3 == 1);
    }
    destroy(m);
  }
}

TEST_P(VectorFormsTest, a_bilinear_form_has_a_row_for_each_left_and_a_column_for_each_right_vector) {
  Random random(6);
  for (const Operand& operand : symmetric_and_diagonal())
    for (const std::int64_t n : {1, 2, 5})
      for (const auto& [p, q] : {std::pair{1, 1}, std::pair{1, 4}, std::pair{3, 1}, std::pair{3, 4}, std::pair{4, 3}}) {
        const Known known = random_known(random, operand.shape, n, n);
        SmMatrix* m = build(operand, known);
        const std::vector<double> x = random.vector(n * p);
        const std::vector<double> y = random.vector(n * q);
        Output r(std::vector<double>(at(p * q), kNan));
        ASSERT_EQ(bilinear(m, x, y, r, p, q), SM_OK);
        EXPECT_TRUE(same(r.values(), full_form(known, x, y, p, q))) << name_of(operand);
        EXPECT_TRUE(same_entries(read(m), known));
        destroy(m);
      }
}

TEST_P(VectorFormsTest, a_bilinear_form_of_the_same_vectors_twice_is_symmetric) {
  Random random(7);
  for (const Operand& operand : symmetric_and_diagonal()) {
    const Known known = random_known(random, operand.shape, 5, 5);
    const std::vector<double> x = random.vector(15);
    Output r(9);
    ASSERT_EQ(bilinear(build(operand, known), x, x, r, 3, 3), SM_OK);
    const std::vector<double> got = r.values();
    EXPECT_TRUE(same(got, full_form(known, x, x, 3, 3))) << name_of(operand);
    for (std::size_t i = 0; i < 3; ++i)
      for (std::size_t j = 0; j < i; ++j) EXPECT_EQ(got[i + 3 * j], got[j + 3 * i]);
  }
}

TEST_P(VectorFormsTest, nothing_is_allocated) {
  Random random(8);
  for (const Operand& operand : all_operands()) {
    const Known known = random_known(random, operand.shape, 20, 20);
    SmMatrix* m = build(operand, known);
    const std::vector<double> x = random.vector(60);
    Output r(9);
    EXPECT_EQ(without_memory([&] { return quadratic(m, x, r, 3, 0, 19); }), SM_OK) << name_of(operand);
    if (operand.shape.kind == SM_KIND_GENERAL) continue;
    EXPECT_EQ(without_memory([&] { return bilinear(m, x, x, r, 3, 3); }), SM_OK) << name_of(operand);
  }
}

}  // namespace
}  // namespace sm::test
