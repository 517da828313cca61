// qxsmmultv: every block of every kind of matrix against its elements.
#include <cmath>
#include <cstring>

#include "forms/blocks.hpp"

namespace sm::test {
namespace {

class MultiplyTest : public FormsTest {
 protected:
  // Every block of the matrix, with and without accumulation, against the elements in `known`.
  void expect_every_block(Operand operand, const Known& known, std::int64_t k);
};
INSTANTIATE_BOTH_HOSTS(MultiplyTest);

void MultiplyTest::expect_every_block(Operand operand, const Known& known, std::int64_t k) {
  SCOPED_TRACE(name_of(operand));
  Random random(static_cast<std::uint64_t>(k));
  SmMatrix* m = build(operand, known);
  for (const Block& b : all_blocks(known.rows(), known.cols())) {
    SCOPED_TRACE(name_of(b));
    const std::vector<double> x = random.vector(b.width() * k);
    const std::vector<double> before = random.vector(b.height() * k);
    const SmStatus want = answer_for(operand, known, b);
    for (const std::int32_t accumulate : {0, 1}) {
      const std::vector<double> start = accumulate ? before : std::vector<double>(before.size(), 0.0);
      Output y(before);
      ASSERT_EQ(qxsmmultv(m, x.data(), y.data(), b.r0, b.r1, b.c0, b.c1, k, accumulate), want);
      ASSERT_TRUE(same(y.values(), want == SM_OK ? block_times(operand.shape, known, b, x, k, start) : start));
    }
  }
  EXPECT_TRUE(same_entries(read(m), known));
  EXPECT_EQ(m->state, operand.state);
  destroy(m);
}

TEST_P(MultiplyTest, every_block_of_every_square_matrix_is_that_of_its_elements) {
  for (const std::int64_t n : {1, 2, 5}) {
    Random random(static_cast<std::uint64_t>(n));
    for (const Operand& operand : all_operands())
      expect_every_block(operand, random_known(random, operand.shape, n, n), 2);
  }
}

TEST_P(MultiplyTest, every_block_of_a_rectangular_matrix_is_that_of_its_elements) {
  Random random(4);
  for (const Operand& operand : kGeneralOperands) {
    expect_every_block(operand, random_known(random, operand.shape, 3, 6), 1);
    expect_every_block(operand, random_known(random, operand.shape, 6, 3), 3);
    expect_every_block(operand, random_known(random, operand.shape, 1, 4), 2);
    expect_every_block(operand, random_known(random, operand.shape, 4, 1), 2);
  }
}

TEST_P(MultiplyTest, random_symmetric_sparse_patterns_give_the_block_of_the_full_matrix) {
  for (std::uint64_t seed = 0; seed < 12; ++seed) {
    Random random(100 + seed);
    expect_every_block({kSymmetricSparse}, random_known(random, kSymmetricSparse, 6, 6), 1);
    expect_every_block({kSymmetricRows}, random_known(random, kSymmetricRows, 6, 6), 1);
  }
}

TEST_P(MultiplyTest, every_length_around_a_lane_of_the_processor_is_summed_whole) {
  Random random(8);
  for (const std::int64_t n : {3, 7, 8, 9, 15, 16, 17, 31, 32, 33, 47, 64, 65})
    for (const Operand& operand : all_operands()) {
      SCOPED_TRACE(name_of(operand) + " of order " + std::to_string(n));
      const Known known = random_known(random, operand.shape, n, n);
      SmMatrix* m = build(operand, known);
      for (const Block& b : {Block{0, n - 1, 0, n - 1}, Block{1, n - 1, 0, n - 2}, Block{0, n - 2, 1, n - 1}}) {
        const std::vector<double> x = random.vector(b.width() * 2);
        const SmStatus want = answer_for(operand, known, b);
        Output y(b.height() * 2);
        ASSERT_EQ(qxsmmultv(m, x.data(), y.data(), b.r0, b.r1, b.c0, b.c1, 2, 0), want);
        if (want != SM_OK) continue;
        ASSERT_TRUE(
            same(y.values(), block_times(operand.shape, known, b, x, 2, std::vector<double>(at(b.height() * 2)))));
      }
      destroy(m);
    }
}

TEST_P(MultiplyTest, a_vector_that_a_library_would_take_is_summed_with_its_zeros_and_infinities) {
  Random random(9);
  const std::int64_t n = 513;
  for (const Shape shape : kShapes) {
    SCOPED_TRACE(name_of(shape));
    Known known = random_known(random, shape, n, n);
    std::vector<double> x = random.vector(n);
    for (const bool special : {false, true}) {
      if (special) {
        known.set(7, 7, kInfinity);
        x[7] = 0.0;
      }
      SmMatrix* m = build(shape, known);
      Output y(n);
      ASSERT_EQ(qxsmmultv(m, x.data(), y.data(), 0, n - 1, 0, n - 1, 1, 0), SM_OK);
      EXPECT_TRUE(same(y.values(), block_times(shape, known, {0, n - 1, 0, n - 1}, x, 1, std::vector<double>(at(n)))));
      EXPECT_EQ(std::isnan(y.values()[7]), special);
      destroy(m);
    }
  }
}

TEST_P(MultiplyTest, elements_outside_the_block_never_reach_the_result) {
  Random random(12);
  for (const Shape shape : kShapes) {
    if (shape == kSymmetricColumns) continue;  // whole matrices only
    for (const Block& b : all_blocks(5, 5)) {
      SCOPED_TRACE(name_of(shape) + ' ' + name_of(b));
      Known known = random_known(random, shape, 5, 5);
      for (std::int64_t r = 0; r < 5; ++r)
        for (std::int64_t c = 0; c < 5; ++c) {
          const bool mirrored = shape.kind == SM_KIND_SYMMETRIC && b.holds(c, r);
          if (known.has(r, c) && !b.holds(r, c) && !mirrored) known.set(r, c, kNan);
        }
      SmMatrix* m = build(shape, known);
      const std::vector<double> x = random.vector(b.width());
      Output y(b.height());
      ASSERT_EQ(qxsmmultv(m, x.data(), y.data(), b.r0, b.r1, b.c0, b.c1, 1, 0), SM_OK);
      const std::vector<double> got = y.values();
      ASSERT_TRUE(same(got, block_times(shape, known, b, x, 1, std::vector<double>(at(b.height())))));
      for (const double v : got) ASSERT_FALSE(std::isnan(v));
      destroy(m);
    }
  }
}

TEST_P(MultiplyTest, infinities_and_nans_of_the_matrix_propagate_against_zeros_of_x) {
  for (const Operand& operand : all_operands()) {
    if (operand.state > SM_STATE_REORDERED) continue;  // what holds an infinity is not factored
    Random random(21);
    const Known clean = random_known(random, operand.shape, 4, 4);
    for (const double special : {kInfinity, -kInfinity, kNan}) {
      SCOPED_TRACE(name_of(operand));
      Known known = clean;
      if (operand.shape.kind == SM_KIND_DIAGONAL) {
        known.set(2, 2, special);
      } else if (operand.shape.kind == SM_KIND_SYMMETRIC) {
        known.set_both(1, 3, special);
      } else {
        known.set(1, 3, special);
      }
      SmMatrix* m = build(operand, known);
      for (const std::vector<double>& x : {std::vector<double>(4, 0.0), std::vector<double>(4, 1.0),
                                           std::vector<double>{1.0, 0.0, 2.0, 0.0}, std::vector<double>(4, -0.0)}) {
        Output y(4);
        ASSERT_EQ(qxsmmultv(m, x.data(), y.data(), 0, 3, 0, 3, 1, 0), SM_OK);
        ASSERT_TRUE(same(y.values(), block_times(operand.shape, known, {0, 3, 0, 3}, x, 1, std::vector<double>(4))));
      }
      destroy(m);
    }
  }
}

TEST_P(MultiplyTest, infinities_and_nans_of_x_propagate_through_stored_elements_only) {
  for (const Operand& operand : all_operands()) {
    Random random(22);
    SCOPED_TRACE(name_of(operand));
    const Known known = random_known(random, operand.shape, 5, 5);
    SmMatrix* m = build(operand, known);
    for (std::int64_t place = 0; place < 5; ++place)
      for (const double special : {kInfinity, -kInfinity, kNan})
        for (const Block& b : {Block{0, 4, 0, 4}, Block{1, 3, 0, 4}, Block{0, 4, 0, 3}}) {
          if (answer_for(operand, known, b) != SM_OK || place >= b.width()) continue;
          std::vector<double> x = random.vector(b.width());
          x[at(place)] = special;
          Output y(b.height());
          ASSERT_EQ(qxsmmultv(m, x.data(), y.data(), b.r0, b.r1, b.c0, b.c1, 1, 0), SM_OK);
          ASSERT_TRUE(
              same(y.values(), block_times(operand.shape, known, b, x, 1, std::vector<double>(at(b.height())))));
        }
    destroy(m);
  }
}

TEST_P(MultiplyTest, a_second_call_that_accumulates_doubles_the_product) {
  Random random(5);
  for (const Operand& operand : all_operands())
    for (const std::int32_t flag : {1, -1, 0x10000, std::numeric_limits<std::int32_t>::min()}) {
      SCOPED_TRACE(name_of(operand));
      SmMatrix* m = build(operand, random_known(random, operand.shape, 4, 4));
      const std::vector<double> x = random.vector(12);
      Output y(12);
      ASSERT_EQ(qxsmmultv(m, x.data(), y.data(), 0, 3, 0, 3, 3, 0), SM_OK);
      std::vector<double> twice = y.values();
      for (double& v : twice) v *= 2.0;
      ASSERT_EQ(qxsmmultv(m, x.data(), y.data(), 0, 3, 0, 3, 3, flag), SM_OK);
      EXPECT_TRUE(same(y.values(), twice));
      destroy(m);
    }
}

TEST_P(MultiplyTest, one_row_and_one_column_give_one_product_a_vector) {
  Random random(6);
  for (const Shape shape : kShapes) {
    if (shape == kSymmetricColumns) continue;
    const Known known = random_known(random, shape, 3, 3);
    SmMatrix* m = build(shape, known);
    for (std::int64_t r = 0; r < 3; ++r)
      for (std::int64_t c = 0; c < 3; ++c) {
        const std::vector<double> x = random.vector(2);
        Output y(2);
        ASSERT_EQ(qxsmmultv(m, x.data(), y.data(), r, r, c, c, 2, 0), SM_OK);
        EXPECT_TRUE(same(y.values(), {known(r, c) * x[0], known(r, c) * x[1]})) << name_of(shape);
      }
  }
}

TEST_P(MultiplyTest, a_diagonal_matrix_adds_nothing_to_a_block_that_its_columns_enclose) {
  for (const Shape shape : {kDiagonalColumns, kDiagonalRows}) {
    Known d(7, 7);
    for (std::int64_t i = 0; i < 7; ++i) d.set(i, i, static_cast<double>(i + 2));
    SmMatrix* m = build(shape, d);
    const std::vector<double> x{1.0, 10.0, 100.0, 1000.0, 10000.0};
    Output enclosed(2);
    EXPECT_EQ(qxsmmultv(m, x.data(), enclosed.data(), 2, 3, 1, 5, 1, 0), SM_OK);
    EXPECT_TRUE(same(enclosed.values(), {0.0, 0.0}));
    Output kept(std::vector<double>{5.0, 6.0});
    EXPECT_EQ(qxsmmultv(m, x.data(), kept.data(), 2, 3, 1, 4, 1, 1), SM_OK);
    EXPECT_TRUE(kept.untouched());
    Output met(2);  // columns 2 to 5: the first end lies in the rows
    EXPECT_EQ(qxsmmultv(m, x.data(), met.data(), 2, 3, 2, 5, 1, 0), SM_OK);
    EXPECT_TRUE(same(met.values(), {4.0 * 1.0, 5.0 * 10.0}));
    Output ended(2);  // columns 1 to 3: the last one does
    EXPECT_EQ(qxsmmultv(m, x.data(), ended.data(), 2, 3, 1, 3, 1, 0), SM_OK);
    EXPECT_TRUE(same(ended.values(), {4.0 * 10.0, 5.0 * 100.0}));
    Output within(5);  // rows 1 to 5 enclose columns 2 to 3
    EXPECT_EQ(qxsmmultv(m, x.data(), within.data(), 1, 5, 2, 3, 1, 0), SM_OK);
    EXPECT_TRUE(same(within.values(), {0.0, 4.0 * 1.0, 5.0 * 10.0, 0.0, 0.0}));
  }
}

TEST_P(MultiplyTest, a_general_sparse_matrix_that_grew_is_multiplied_in_its_new_size) {
  SmMatrix* m = sized(kGeneralSparse, 2, 2);
  ASSERT_EQ(fn().qxsmassign(m, 30, 40, 0, 3.0), SM_OK);
  ASSERT_EQ(fn().qxsmassign(m, 1, 40, 0, 5.0), SM_OK);
  std::vector<double> x(41, 1.0);
  x[40] = 2.0;
  std::vector<double> want(31, 0.0);
  want[1] = 10.0;
  want[30] = 6.0;
  Output y(31);
  ASSERT_EQ(qxsmmultv(m, x.data(), y.data(), 0, 30, 0, 40, 1, 0), SM_OK);
  EXPECT_TRUE(same(y.values(), want));
}

TEST_P(MultiplyTest, nothing_is_allocated) {
  Random random(7);
  for (const Operand& operand : all_operands()) {
    const Known known = random_known(random, operand.shape, 40, 40);
    SmMatrix* m = build(operand, known);
    const std::vector<double> x = random.vector(80);
    Output y(80);
    EXPECT_EQ(without_memory([&] { return qxsmmultv(m, x.data(), y.data(), 0, 39, 0, 39, 2, 0); }), SM_OK);
    EXPECT_TRUE(same(y.values(), block_times(operand.shape, known, {0, 39, 0, 39}, x, 2, std::vector<double>(80))));
    EXPECT_EQ(without_memory([&] { return qxsmvmult(x.data(), m, y.data(), 2, 0); }), SM_OK);
  }
}

}  // namespace
}  // namespace sm::test
