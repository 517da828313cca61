// qxsmmultm: what becomes of its result matrix.
#include <cmath>

#include "forms/product_support.hpp"

namespace sm::test {
namespace {

class ProductResultTest : public FormsTest {
 protected:
  SmMatrix* of(Shape shape, const std::vector<std::vector<double>>& rows) { return build(shape, Known::full(rows)); }
  SmMatrix* diagonal_of(const std::vector<double>& d, Operand operand = {kDiagonalRows}) {
    return build(operand, diagonal_known(d));
  }
  static Known diagonal_known(const std::vector<double>& d) {
    Known k(static_cast<std::int64_t>(d.size()), static_cast<std::int64_t>(d.size()));
    for (std::int64_t i = 0; i < k.rows(); ++i) k.set(i, i, d[at(i)]);
    return k;
  }
};
INSTANTIATE_BOTH_HOSTS(ProductResultTest);

TEST_P(ProductResultTest, is_left_open_so_that_more_can_be_entered) {
  SmMatrix* a = of(kGeneralSparse, {{1.0, 2.0}, {3.0, 4.0}});
  for (const std::int32_t keep : {0, 1}) {
    SmMatrix* c = sized(kSymmetricSparse, 2);
    ASSERT_EQ(qxsmmultm(a, a, c, keep), SM_OK);
    EXPECT_EQ(c->state, SM_STATE_OPEN);
    ASSERT_EQ(fn().qxsmassign(c, 0, 1, 1, 100.0), SM_OK);
    ASSERT_EQ(fn().qxsmclose(c, 0.0), SM_OK);
    EXPECT_TRUE(same(read(c), Known::full({{7.0, 110.0}, {110.0, 22.0}})));
  }
}

TEST_P(ProductResultTest, of_two_diagonal_matrices_is_closed_unless_it_is_kept) {
  SmMatrix* a = diagonal_of({2.0, 0.0, 4.0});
  SmMatrix* b = diagonal_of({3.0, 5.0, -1.0}, {kDiagonalColumns});
  const Known want = diagonal_known({6.0, 0.0, -4.0});
  for (const Shape into : kShapes) {
    SCOPED_TRACE(name_of(into));
    SmMatrix* c = typed(into);
    ASSERT_EQ(qxsmmultm(a, b, c, 0), SM_OK);
    EXPECT_EQ(c->state, SM_STATE_CLOSED);
    EXPECT_TRUE(same(read(c), want));
    if (is_sparse(into)) {
      EXPECT_TRUE(same_entries(read(c), want)) << "a zero is entered too";
    }
  }
  SmMatrix* kept = sized(kSymmetricSparse, 3);
  ASSERT_EQ(qxsmmultm(a, b, kept, 1), SM_OK);
  EXPECT_EQ(kept->state, SM_STATE_OPEN);
  EXPECT_TRUE(same(read(kept), want));
}

TEST_P(ProductResultTest, of_two_diagonal_matrices_is_written_into_a_diagonal_one_which_loses_its_factor) {
  SmMatrix* a = diagonal_of({2.0, 3.0});
  SmMatrix* b = diagonal_of({5.0, 7.0});
  for (const Shape shape : {kDiagonalColumns, kDiagonalRows})
    for (const std::int32_t keep : {0, 1})
      for (const std::int32_t state : {SM_STATE_CLOSED, SM_STATE_FACTORED, SM_STATE_INVERTED}) {
        SmMatrix* c = diagonal_of({4.0, 9.0}, {shape, state});
        const std::int64_t loose = host().live_blocks() - blocks_of(c);
        ASSERT_EQ(qxsmmultm(a, b, c, keep), SM_OK);
        EXPECT_TRUE(same(read(c), diagonal_known({10.0, 21.0})));
        EXPECT_EQ(c->state, SM_STATE_CLOSED);
        EXPECT_EQ(c->dense_factor, nullptr);
        expect_voided(c);
        EXPECT_EQ(host().live_blocks() - blocks_of(c), loose);
      }
}

TEST_P(ProductResultTest, a_kept_diagonal_one_must_have_the_order_of_two_diagonal_factors) {
  SmMatrix* a = diagonal_of({2.0, 3.0});
  for (const std::vector<double>& d : {std::vector<double>{4.0}, std::vector<double>{4.0, 9.0, 16.0}}) {
    SmMatrix* c = diagonal_of(d, {kDiagonalRows, SM_STATE_FACTORED});
    EXPECT_EQ(qxsmmultm(a, a, c, 1), SM_DIMENSION_MISMATCH);
    EXPECT_TRUE(same(read(c), diagonal_known(d)));
    EXPECT_EQ(qxsmmultm(a, a, c, 0), SM_OK);
    EXPECT_TRUE(same(read(c), diagonal_known({4.0, 9.0})));
  }
  EXPECT_EQ(qxsmmultm(a, a, typed(kDiagonalRows), 1), SM_DIMENSION_MISMATCH);
}

TEST_P(ProductResultTest, loses_an_earlier_factor_when_it_is_sized) {
  SmMatrix* a = of(kGeneralRows, {{1.0, 2.0}, {3.0, 4.0}});
  SmMatrix* d = diagonal_of({1.0, 1.0});
  Random random(1);
  for (const Operand& operand : symmetric_and_diagonal())
    for (const std::int64_t n : {2, 3}) {
      SCOPED_TRACE(name_of(operand));
      SmMatrix* c = build(operand, random_known(random, operand.shape, n, n));
      ASSERT_EQ(qxsmmultm(d, a, c, 0), SM_OK);
      EXPECT_EQ(c->state, operand.shape == kSymmetricSparse ? SM_STATE_OPEN : SM_STATE_CLOSED);
      expect_voided(c);
      EXPECT_TRUE(same(read(c), taken(operand.shape, Known::full({{1.0, 2.0}, {3.0, 4.0}}))));
      if (!is_sparse(operand.shape)) {
        EXPECT_EQ(c->dense_factor, nullptr);
      }
    }
}

TEST_P(ProductResultTest, grows_when_it_is_sparse_kept_and_too_small) {
  SmMatrix* a = of(kGeneralSparse, {{1.0, 2.0}, {3.0, 4.0}});
  SmMatrix* general = sized(kGeneralSparse, 1, 1);
  ASSERT_EQ(qxsmmultm(a, a, general, 1), SM_OK);
  EXPECT_TRUE(same(read(general), Known::full({{7.0, 10.0}, {15.0, 22.0}})));
  SmMatrix* symmetric = sized(kSymmetricSparse, 1);
  ASSERT_EQ(qxsmmultm(a, a, symmetric, 1), SM_OK);
  ASSERT_EQ(fn().qxsmclose(symmetric, kNan), SM_OK);
  EXPECT_TRUE(same(read(symmetric), Known::full({{7.0, 10.0}, {10.0, 22.0}})));
}

TEST_P(ProductResultTest, elements_outside_a_packed_result_are_passed_over) {
  SmMatrix* a = of(kGeneralRows, {{1.0, 2.0, 0.0}, {3.0, 4.0, 1.0}, {0.0, 1.0, 1.0}});
  for (const Shape shape : kPacked) {
    SmMatrix* c = of(shape, {{100.0, 200.0}, {200.0, 300.0}});
    ASSERT_EQ(qxsmmultm(a, a, c, 1), SM_OK);
    EXPECT_TRUE(same(read(c), Known::full({{107.0, 210.0}, {210.0, 323.0}}))) << name_of(shape);
  }
  for (const Shape shape : {kDiagonalColumns, kDiagonalRows}) {
    SmMatrix* c = diagonal_of({100.0, 200.0}, {shape});
    ASSERT_EQ(qxsmmultm(diagonal_of({1.0, 2.0, 3.0}), a, c, 1), SM_OK);
    EXPECT_TRUE(same(read(c), diagonal_known({101.0, 208.0}))) << name_of(shape);
  }
}

TEST_P(ProductResultTest, elements_past_a_general_array_that_is_kept_go_where_their_position_is) {
  SmMatrix* a = of(kGeneralRows, {{1.0, 2.0, 4.0}, {8.0, 16.0, 32.0}, {64.0, 128.0, 256.0}});
  SmMatrix* one = diagonal_of({1.0, 1.0, 1.0});
  for (const Shape shape : {kGeneralColumns, kGeneralRows}) {
    SmMatrix* c = sized(shape, 2, 2);
    ASSERT_EQ(qxsmmultm(a, one, c, 1), SM_OK);
    std::vector<double> want(4);
    for (std::int64_t i = 0; i < 3; ++i)
      for (std::int64_t j = 0; j < 3; ++j) {
        const std::int64_t position = shape == kGeneralRows ? i * 2 + j : j * 2 + i;
        if (position < 4) want[at(position)] += std::ldexp(1.0, static_cast<int>(3 * i + j));
      }
    EXPECT_TRUE(same(doubles(c->values, 4), want)) << name_of(shape);
  }
}

// A result that cannot have the shape of the product is refused by its sizing, and that answer is passed over.
TEST_P(ProductResultTest, whose_sizing_is_refused_takes_what_finds_a_place) {
  SmMatrix* a = of(kGeneralRows, {{1.0, 2.0}, {3.0, 4.0}});
  SmMatrix* b = of(kGeneralColumns, {{1.0, 0.0, 2.0}, {0.0, 1.0, 3.0}});  // a b = {{1, 2, 8}, {3, 4, 18}}
  for (const Shape shape : kPacked) {
    SmMatrix* c = of(shape, {{100.0, 200.0}, {200.0, 300.0}});
    ASSERT_EQ(qxsmmultm(a, b, c, 0), SM_OK);
    EXPECT_EQ(c->rows, 2);
    EXPECT_TRUE(same(read(c), Known::full({{101.0, 202.0}, {202.0, 304.0}}))) << name_of(shape);
  }
  SmMatrix* c = diagonal_of({100.0, 200.0});
  ASSERT_EQ(qxsmmultm(diagonal_of({2.0, 3.0}), b, c, 0), SM_OK);
  EXPECT_TRUE(same(read(c), diagonal_known({102.0, 203.0})));
  for (const Shape shape : {kSymmetricColumns, kSymmetricRows, kSymmetricSparse}) {
    SmMatrix* unsized = typed(shape);
    EXPECT_EQ(qxsmmultm(a, b, unsized, 0), SM_OK) << name_of(shape);
    EXPECT_EQ(unsized->nnz, 0);
  }
  EXPECT_EQ(qxsmmultm(a, b, new_untyped(session()), 0), SM_OK);
  EXPECT_EQ(qxsmmultm(a, b, new_untyped(session()), 1), SM_OK);
}

TEST_P(ProductResultTest, without_memory_for_its_array_answers_101_when_something_has_to_be_entered) {
  SmMatrix* a = of(kGeneralRows, {{1.0, 2.0}, {3.0, 4.0}});
  SmMatrix* d = diagonal_of({1.0, 2.0});
  for (SmMatrix* b : {a, d})
    for (SmMatrix* left : {a, d})
      for (const Shape shape : kShapes) {
        if (left == a && b == a && shape.kind == SM_KIND_DIAGONAL) continue;
        SmMatrix* c = typed(shape);
        host().fail_request(0, false);
        EXPECT_EQ(qxsmmultm(left, b, c, 0), SM_NO_MEMORY) << name_of(shape);
        EXPECT_EQ(host().stop_failing(), 1);
        EXPECT_EQ(qxsmmultm(left, b, c, 0), SM_OK) << name_of(shape);
      }
  SmMatrix* empty = sized(kGeneralSparse, 2, 2);
  for (const Shape shape : {kGeneralSparse, kGeneralRows, kSymmetricColumns, kSymmetricSparse}) {
    SmMatrix* c = typed(shape);
    host().fail_request(0, false);
    EXPECT_EQ(qxsmmultm(empty, a, c, 0), SM_OK) << name_of(shape);
    EXPECT_EQ(host().stop_failing(), 1);
  }
}

TEST_P(ProductResultTest, too_large_for_an_array_answers_105) {
  SmMatrix* a = of(kGeneralRows, {{1.0}, {2.0}});
  SmMatrix* b = sized(kGeneralSparse, 1, SM_MAX_ELEMENTS);
  ASSERT_EQ(fn().qxsmassign(b, 0, 0, 0, 3.0), SM_OK);
  for (const Shape shape : {kGeneralColumns, kGeneralRows}) {
    EXPECT_EQ(qxsmmultm(a, b, typed(shape), 0), SM_TOO_LARGE) << name_of(shape);
  }
}

TEST_P(ProductResultTest, a_closed_sparse_one_that_is_kept_answers_119) {
  SmMatrix* a = of(kGeneralRows, {{1.0, 2.0}, {3.0, 4.0}});
  SmMatrix* c = of(kSymmetricSparse, {{1.0, 2.0}, {2.0, 3.0}});
  const std::int64_t blocks = host().live_blocks();
  for (SmMatrix* left : {a, diagonal_of({1.0, 2.0}), of(kSymmetricRows, {{1.0, 2.0}, {2.0, 3.0}})}) {
    EXPECT_EQ(qxsmmultm(left, a, c, 1), SM_ALREADY_CLOSED);
    EXPECT_TRUE(same(read(c), Known::full({{1.0, 2.0}, {2.0, 3.0}})));
    if (left != a) destroy(left);
  }
  EXPECT_EQ(host().live_blocks(), blocks);
}

TEST_P(ProductResultTest, a_refused_entry_ends_the_product_at_once) {
  SmMatrix* a = of(kGeneralRows, {{1.0, 2.0}, {3.0, 4.0}});
  for (const Shape shape : kGeneralShapes) {
    SmMatrix* b = of(shape, {{1.0, 1.0}, {1.0, 1.0}});
    SmMatrix* c = sized(kGeneralSparse, 2, 2);
    ASSERT_EQ(fn().qxsmassign(c, 1, 1, 0, 5.0), SM_OK);
    c->nnz = SM_MAX_ELEMENTS;  // no new key any more
    EXPECT_EQ(qxsmmultm(a, b, c, 1), SM_TOO_LARGE);
    c->nnz = 1;
    EXPECT_EQ(read(c)(1, 1), 5.0) << name_of(shape);
  }
}

}  // namespace
}  // namespace sm::test
