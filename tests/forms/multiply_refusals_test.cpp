// qxsmmultv: its checks, their order, and what has happened to y by then.
#include "forms/blocks.hpp"

namespace sm::test {
namespace {

class MultiplyRefusalsTest : public FormsTest {
 protected:
  static SmStatus multiply(SmMatrix* m, const double* x, double* y, const Block& b, std::int64_t k = 1,
                           std::int32_t accumulate = 0) {
    return qxsmmultv(m, x, y, b.r0, b.r1, b.c0, b.c1, k, accumulate);
  }
  // Ranges that lie outside a matrix of that size, or are reversed.
  static std::vector<Block> bad_ranges(std::int64_t rows, std::int64_t cols);
  SmMatrix* of(Operand operand, std::int64_t n = 4) {
    Random random(static_cast<std::uint64_t>(n));
    return build(operand, random_known(random, operand.shape, n, n));
  }
};
INSTANTIATE_BOTH_HOSTS(MultiplyRefusalsTest);

std::vector<Block> MultiplyRefusalsTest::bad_ranges(std::int64_t rows, std::int64_t cols) {
  const Block whole{0, rows - 1, 0, cols - 1};
  std::vector<Block> bad;
  for (const std::int64_t low : {std::int64_t{-1}, kLeast}) {
    bad.push_back({low, whole.r1, 0, whole.c1});
    bad.push_back({0, low, 0, whole.c1});
    bad.push_back({0, whole.r1, low, whole.c1});
    bad.push_back({0, whole.r1, 0, low});
  }
  for (const std::int64_t beyond : {std::int64_t{0}, std::int64_t{1}, kHuge - 100}) {
    bad.push_back({rows + beyond, rows + beyond, 0, whole.c1});
    bad.push_back({0, rows + beyond, 0, whole.c1});
    bad.push_back({0, whole.r1, cols + beyond, cols + beyond});
    bad.push_back({0, whole.r1, 0, cols + beyond});
  }
  bad.push_back({1, 0, 0, whole.c1});
  bad.push_back({0, whole.r1, 2, 1});
  bad.push_back({kLeast, kHuge, kLeast, kHuge});
  return bad;
}

TEST_P(MultiplyRefusalsTest, an_empty_matrix_answers_0_before_everything_and_leaves_y) {
  Output y(4);
  for (const Shape shape : kShapes) {
    SmMatrix* unsized = typed(shape);
    EXPECT_EQ(multiply(unsized, y.data(), y.data(), {-1, 9, 3, 2}), SM_OK) << name_of(shape);
    SmMatrix* nothing = sized(shape, 0, 0);
    EXPECT_EQ(multiply(nothing, y.data(), y.data(), {-1, 9, 3, 2}), SM_OK) << name_of(shape);
  }
  SmMatrix* without_entries = sized(kGeneralSparse, 4, 4);
  const std::vector<double> x(4, 1.0);
  EXPECT_EQ(multiply(without_entries, x.data(), y.data(), {0, 3, 0, 3}), SM_OK);
  EXPECT_EQ(multiply(new_untyped(session()), y.data(), y.data(), {-1, 9, 3, 2}), SM_OK);
  EXPECT_TRUE(y.untouched());
}

TEST_P(MultiplyRefusalsTest, kind_none_comes_before_an_open_matrix) {
  SmMatrix* none = new_untyped_with_an_entry(session(), SM_STATE_OPEN);
  Output y(4);
  EXPECT_EQ(multiply(none, y.data(), y.data(), {-1, 9, 3, 2}), SM_UNTYPED);
  EXPECT_TRUE(y.untouched());
}

TEST_P(MultiplyRefusalsTest, an_open_matrix_comes_before_an_alias_and_a_bad_range) {
  Output y(4);
  SmMatrix* sparse = sized(kSymmetricSparse, 4);
  EXPECT_EQ(multiply(sparse, y.data(), y.data(), {-1, 9, 3, 2}), SM_NOT_CLOSED);
  std::vector<double> data(16, 1.0);
  for (const Shape shape : kDense) {
    SmMatrix* tied = new_open_tied(session(), data, 4, 4, shape.kind, shape.format);
    EXPECT_EQ(multiply(tied, y.data(), y.data(), {-1, 9, 3, 2}), SM_NOT_CLOSED) << name_of(shape);
  }
  EXPECT_TRUE(y.untouched());
}

TEST_P(MultiplyRefusalsTest, an_alias_is_refused_before_y_is_cleared) {
  for (const Operand& operand : all_operands())
    for (const Block& b : {Block{0, 3, 0, 3}, Block{1, 2, 0, 3}})
      for (const std::int64_t k : {1, 0}) {
        Output y(4);
        EXPECT_EQ(multiply(of(operand), y.data(), y.data(), b, k), SM_BAD_ARGUMENT) << name_of(operand);
        EXPECT_TRUE(y.untouched());
      }
}

TEST_P(MultiplyRefusalsTest, a_range_outside_the_matrix_or_reversed_is_refused_before_y_is_cleared) {
  const std::vector<double> x(16, 1.0);
  for (const Operand& operand : all_operands()) {
    SmMatrix* m = of(operand);
    for (const Block& b : bad_ranges(4, 4)) {
      Output y(16);
      EXPECT_EQ(multiply(m, x.data(), y.data(), b), SM_BAD_ARGUMENT) << name_of(operand) << ' ' << name_of(b);
      EXPECT_EQ(multiply(m, x.data(), y.data(), b, 0), SM_BAD_ARGUMENT) << name_of(operand) << ' ' << name_of(b);
      EXPECT_TRUE(y.untouched());
    }
  }
  Random random(3);
  for (const Operand& operand : kGeneralOperands) {
    SmMatrix* m = build(operand, random_known(random, operand.shape, 3, 6));
    for (const Block& b : bad_ranges(3, 6)) {
      Output y(16);
      EXPECT_EQ(multiply(m, x.data(), y.data(), b), SM_BAD_ARGUMENT) << name_of(operand) << ' ' << name_of(b);
      EXPECT_TRUE(y.untouched());
    }
  }
}

TEST_P(MultiplyRefusalsTest, without_vectors_the_answer_is_0_whatever_the_block) {
  const std::vector<double> x(4, 1.0);
  for (const Operand& operand : all_operands()) {
    SmMatrix* m = of(operand);
    for (const Block& b : {Block{0, 3, 0, 3}, Block{1, 2, 0, 3}})
      for (const std::int64_t k : {std::int64_t{0}, std::int64_t{-1}, std::int64_t{-5}, kLeast}) {
        Output y(4);
        EXPECT_EQ(multiply(m, x.data(), y.data(), b, k), SM_OK) << name_of(operand) << ' ' << k;
        EXPECT_TRUE(y.untouched());
      }
  }
}

TEST_P(MultiplyRefusalsTest, part_of_a_matrix_in_format_22_answers_124_with_y_cleared) {
  const std::vector<double> x(8, 1.0);
  for (const std::int32_t state : {SM_STATE_CLOSED, SM_STATE_FACTORED, SM_STATE_INVERTED})
    for (const Block& b : {Block{1, 3, 0, 3}, Block{0, 2, 0, 3}, Block{0, 3, 1, 3}, Block{0, 3, 0, 2}}) {
      SmMatrix* m = of({kSymmetricColumns, state});
      Output y(b.height() * 2);
      EXPECT_EQ(multiply(m, x.data(), y.data(), b, 2), SM_UNAVAILABLE) << name_of(b);
      EXPECT_TRUE(same(y.values(), std::vector<double>(at(b.height() * 2), 0.0)));
      Output kept(b.height() * 2);
      EXPECT_EQ(multiply(m, x.data(), kept.data(), b, 2, 1), SM_UNAVAILABLE);
      EXPECT_TRUE(kept.untouched());
    }
}

TEST_P(MultiplyRefusalsTest, part_of_a_sparse_matrix_past_state_1_answers_118_with_y_cleared) {
  const std::vector<double> x(8, 1.0);
  for (std::int32_t state = SM_STATE_CLOSED; state <= SM_STATE_FACTORED; ++state)
    for (const Block& b : {Block{1, 3, 0, 3}, Block{0, 2, 0, 3}, Block{0, 3, 1, 3}, Block{0, 3, 0, 2}}) {
      SmMatrix* m = of({kSymmetricSparse, state});
      const SmStatus want = state == SM_STATE_CLOSED ? SM_OK : SM_REORDERED;
      Output y(b.height() * 2);
      EXPECT_EQ(multiply(m, x.data(), y.data(), b, 2), want) << name_of(b);
      if (want == SM_OK) continue;
      EXPECT_TRUE(same(y.values(), std::vector<double>(at(b.height() * 2), 0.0)));
      Output kept(b.height() * 2);
      EXPECT_EQ(multiply(m, x.data(), kept.data(), b, 2, -1), want);
      EXPECT_TRUE(kept.untouched());
    }
}

TEST_P(MultiplyRefusalsTest, an_unknown_kind_answers_124_with_y_cleared) {
  SmMatrix* m = of({kGeneralRows});
  const std::vector<double> x(4, 1.0);
  for (const std::int32_t kind : {4, 5, 7}) {
    m->kind = kind;
    Output y(4);
    EXPECT_EQ(multiply(m, x.data(), y.data(), {0, 3, 0, 3}), SM_UNAVAILABLE);
    EXPECT_TRUE(same(y.values(), std::vector<double>(4, 0.0)));
    Output z(4);
    EXPECT_EQ(qxsmvmult(x.data(), m, z.data(), 1, 0), SM_UNAVAILABLE);
    EXPECT_TRUE(same(z.values(), std::vector<double>(4, 0.0)));
    EXPECT_EQ(multiply(m, x.data(), z.data(), {0, 3, 0, 3}, 0), SM_OK) << "without vectors there is nothing to refuse";
    EXPECT_EQ(qxsmvmult(x.data(), m, z.data(), 0, 0), SM_OK);
    m->kind = SM_KIND_GENERAL;
  }
}

}  // namespace
}  // namespace sm::test
