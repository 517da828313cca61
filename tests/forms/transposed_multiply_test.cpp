// qxsmvmult: the transposed product of every kind of matrix, its zeros, and its checks.
#include <cmath>

#include "forms/forms_support.hpp"

namespace sm::test {
namespace {

class TransposedMultiplyTest : public FormsTest {
 protected:
  void expect_product(Operand operand, const Known& known, std::int64_t k);
};
INSTANTIATE_BOTH_HOSTS(TransposedMultiplyTest);

// start + the transposed matrix times k vectors, over stored elements, or over those in rows that meet no zero of x.
std::vector<double> transposed_times(const Known& a, const std::vector<double>& x, std::int64_t k,
                                     std::vector<double> start, bool skip_zeros) {
  for (std::int64_t v = 0; v < k; ++v)
    for (std::int64_t r = 0; r < a.rows(); ++r)
      for (std::int64_t c = 0; c < a.cols(); ++c) {
        const double t = x[at(v * a.rows() + r)];
        if (a.has(r, c) && !(skip_zeros && t == 0.0)) start[at(v * a.cols() + c)] += a(r, c) * t;
      }
  return start;
}

void TransposedMultiplyTest::expect_product(Operand operand, const Known& known, std::int64_t k) {
  SCOPED_TRACE(name_of(operand) + ' ' + std::to_string(known.rows()) + " x " + std::to_string(known.cols()));
  Random random(77);
  SmMatrix* m = build(operand, known);
  const std::vector<double> x = random.vector(known.rows() * k);
  const std::vector<double> before = random.vector(known.cols() * k);
  Output y(before);
  ASSERT_EQ(qxsmvmult(x.data(), m, y.data(), k, 0), SM_OK);
  EXPECT_TRUE(same(y.values(), transposed_times(known, x, k, std::vector<double>(before.size()), false)));
  for (const std::int32_t flag : {1, -1, 0x10000}) {
    Output sum(before);
    ASSERT_EQ(qxsmvmult(x.data(), m, sum.data(), k, flag), SM_OK);
    EXPECT_TRUE(same(sum.values(), transposed_times(known, x, k, before, false)));
  }
  EXPECT_TRUE(same_entries(read(m), known));
  destroy(m);
}

TEST_P(TransposedMultiplyTest, is_that_of_the_elements_in_every_kind_and_state) {
  Random random(1);
  for (const std::int64_t n : {1, 2, 3, 7, 8, 9, 15, 16, 17, 33, 64, 65})
    for (const Operand& operand : all_operands()) expect_product(operand, random_known(random, operand.shape, n, n), 2);
}

TEST_P(TransposedMultiplyTest, of_a_rectangular_matrix_has_a_component_for_each_column) {
  Random random(2);
  for (const Operand& operand : kGeneralOperands)
    for (const auto& [rows, cols] :
         {std::pair{1, 5}, std::pair{5, 1}, std::pair{3, 6}, std::pair{6, 3}, std::pair{17, 33}})
      expect_product(operand, random_known(random, operand.shape, rows, cols), 3);
}

TEST_P(TransposedMultiplyTest, only_a_general_sparse_matrix_skips_exact_zeros_of_x) {
  for (const Operand& operand : all_operands()) {
    if (operand.state > SM_STATE_REORDERED) continue;  // what holds an infinity is not factored
    SCOPED_TRACE(name_of(operand));
    Random random(3);
    for (const double special : {kInfinity, -kInfinity, kNan})
      for (const double zero : {0.0, -0.0}) {
        Known known = random_known(random, operand.shape, 4, 4);
        if (operand.shape.kind == SM_KIND_GENERAL) {
          known.set(1, 3, special);
        } else if (operand.shape.kind == SM_KIND_SYMMETRIC) {
          known.set_both(1, 3, special);
        } else {
          known.set(1, 1, special);
        }
        SmMatrix* m = build(operand, known);
        const std::vector<double> x{1.0, zero, 2.0, 3.0};
        Output y(4);
        ASSERT_EQ(qxsmvmult(x.data(), m, y.data(), 1, 0), SM_OK);
        const bool skips = operand.shape == kGeneralSparse;
        const std::vector<double> want = transposed_times(known, x, 1, std::vector<double>(4), skips);
        ASSERT_TRUE(same(y.values(), want));
        const std::int64_t met = operand.shape.kind == SM_KIND_DIAGONAL ? 1 : 3;
        EXPECT_EQ(std::isnan(want[at(met)]), !skips);
        destroy(m);
      }
  }
}

TEST_P(TransposedMultiplyTest, a_nan_and_an_infinity_of_x_are_not_skipped) {
  for (const Operand& operand : all_operands()) {
    SCOPED_TRACE(name_of(operand));
    Random random(4);
    const Known known = random_known(random, operand.shape, 5, 5);
    SmMatrix* m = build(operand, known);
    for (std::int64_t place = 0; place < 5; ++place)
      for (const double special : {kInfinity, -kInfinity, kNan}) {
        std::vector<double> x = random.vector(5);
        x[at(place)] = special;
        x[at((place + 2) % 5)] = 0.0;
        Output y(5);
        ASSERT_EQ(qxsmvmult(x.data(), m, y.data(), 1, 0), SM_OK);
        ASSERT_TRUE(
            same(y.values(), transposed_times(known, x, 1, std::vector<double>(5), operand.shape == kGeneralSparse)));
      }
    destroy(m);
  }
}

TEST_P(TransposedMultiplyTest, an_empty_matrix_answers_0_before_everything_and_leaves_y) {
  Output y(4);
  for (const Shape shape : kShapes) {
    EXPECT_EQ(qxsmvmult(y.data(), typed(shape), y.data(), 1, 0), SM_OK);
    EXPECT_EQ(qxsmvmult(y.data(), sized(shape, 0, 0), y.data(), 1, 0), SM_OK);
  }
  const std::vector<double> x(4, 1.0);
  EXPECT_EQ(qxsmvmult(x.data(), sized(kGeneralSparse, 4, 4), y.data(), 1, 0), SM_OK);
  EXPECT_TRUE(y.untouched());
}

TEST_P(TransposedMultiplyTest, kind_none_then_an_open_matrix_then_an_alias) {
  Output y(4);
  SmMatrix* none = new_untyped_with_an_entry(session(), SM_STATE_OPEN);
  EXPECT_EQ(qxsmvmult(y.data(), none, y.data(), 1, 0), SM_UNTYPED);
  EXPECT_EQ(qxsmvmult(y.data(), sized(kSymmetricSparse, 4), y.data(), 1, 0), SM_NOT_CLOSED);
  std::vector<double> data(16, 1.0);
  for (const Shape shape : kDense) {
    SmMatrix* tied = new_open_tied(session(), data, 4, 4, shape.kind, shape.format);
    EXPECT_EQ(qxsmvmult(y.data(), tied, y.data(), 1, 0), SM_NOT_CLOSED) << name_of(shape);
  }
  Random random(5);
  for (const Operand& operand : all_operands())
    for (const std::int64_t k : {1, 0}) {
      SmMatrix* m = build(operand, random_known(random, operand.shape, 4, 4));
      EXPECT_EQ(qxsmvmult(y.data(), m, y.data(), k, 0), SM_BAD_ARGUMENT) << name_of(operand);
    }
  EXPECT_TRUE(y.untouched());
}

TEST_P(TransposedMultiplyTest, without_vectors_nothing_is_written) {
  Random random(6);
  const std::vector<double> x(4, 1.0);
  for (const Operand& operand : all_operands()) {
    SmMatrix* m = build(operand, random_known(random, operand.shape, 4, 4));
    for (const std::int64_t k : {std::int64_t{0}, std::int64_t{-1}, std::int64_t{-5}, kLeast}) {
      Output y(4);
      EXPECT_EQ(qxsmvmult(x.data(), m, y.data(), k, 0), SM_OK) << name_of(operand);
      EXPECT_TRUE(y.untouched());
    }
  }
}

}  // namespace
}  // namespace sm::test
