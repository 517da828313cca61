// qxsmmultm: every pair of kinds and formats into every result.
#include <cmath>

#include "forms/product_support.hpp"

namespace sm::test {
namespace {

class ProductTest : public FormsTest {
 protected:
  void expect_product(SmMatrix* a, SmMatrix* b, const Known& want, Shape into, bool both_diagonal);
};
INSTANTIATE_BOTH_HOSTS(ProductTest);

bool diagonal(Shape shape) { return shape.kind == SM_KIND_DIAGONAL; }

// Into a new result, and added to what a kept one holds.
void ProductTest::expect_product(SmMatrix* a, SmMatrix* b, const Known& want, Shape into, bool both_diagonal) {
  SCOPED_TRACE("into " + name_of(into));
  Random random(5);
  const bool open = into == kSymmetricSparse && !both_diagonal;
  SmMatrix* c = build(into, random_known(random, into, 2, 2));
  ASSERT_EQ(qxsmmultm(a, b, c, 0), SM_OK);
  EXPECT_EQ(c->state, open ? SM_STATE_OPEN : SM_STATE_CLOSED);
  EXPECT_TRUE(same(read(c), taken(into, want)));
  ASSERT_EQ(fn().qxsmclose(c, kNan), SM_OK);
  EXPECT_TRUE(same(read(c), taken(into, want)));
  destroy(c);

  const Known before = random_known(random, into, want.rows(), want.cols());
  SmMatrix* kept = new_entered(session(), into, before.rows(), before.cols(), before.elements(into));
  ASSERT_EQ(qxsmmultm(a, b, kept, 0x10000), SM_OK);
  EXPECT_EQ(kept->state, into == kSymmetricSparse ? SM_STATE_OPEN : SM_STATE_CLOSED);
  const bool written = both_diagonal && diagonal(into);
  EXPECT_TRUE(same(read(kept), written ? want : sum(before, taken(into, want))));
  destroy(kept);
}

TEST_P(ProductTest, every_pair_of_square_matrices_gives_the_product_of_their_elements) {
  Random random(1);
  for (const Operand& left : all_operands())
    for (const Operand& right : all_operands()) {
      if (!multiplies(left.shape, right.shape)) continue;
      if (left.state == SM_STATE_INVERTED || right.state == SM_STATE_INVERTED) continue;
      for (const std::int64_t n : {1, 4}) {
        SCOPED_TRACE(name_of(left) + " times " + name_of(right));
        const Known known_a = random_known(random, left.shape, n, n);
        const Known known_b = random_known(random, right.shape, n, n);
        SmMatrix* a = build(left, known_a);
        SmMatrix* b = build(right, known_b);
        const Known want = product(known_a, known_b);
        for (const Shape into : kShapes) {
          if (diagonal(into) && !diagonal(left.shape) && !diagonal(right.shape)) continue;
          expect_product(a, b, want, into, diagonal(left.shape) && diagonal(right.shape));
        }
        EXPECT_TRUE(same_entries(read(a), known_a));
        EXPECT_TRUE(same_entries(read(b), known_b));
        EXPECT_EQ(a->state, left.state);
        EXPECT_EQ(b->state, right.state);
        destroy(a);
        destroy(b);
      }
    }
}

TEST_P(ProductTest, rectangular_matrices_give_the_product_of_their_elements) {
  Random random(2);
  for (const Operand& left : all_operands())
    for (const Operand& right : all_operands()) {
      if (!multiplies(left.shape, right.shape)) continue;
      if (left.shape.kind != SM_KIND_GENERAL && right.shape.kind != SM_KIND_GENERAL) continue;
      if (left.state == SM_STATE_INVERTED || right.state == SM_STATE_INVERTED) continue;
      SCOPED_TRACE(name_of(left) + " times " + name_of(right));
      for (const auto& [rows, cols] : {std::pair{3, 7}, std::pair{7, 3}, std::pair{1, 6}, std::pair{6, 1}}) {
        const std::int64_t n = 5;
        const Known known_a = random_known(random, left.shape, left.shape.kind == SM_KIND_GENERAL ? rows : n, n);
        const Known known_b = random_known(random, right.shape, n, right.shape.kind == SM_KIND_GENERAL ? cols : n);
        SmMatrix* a = build(left, known_a);
        SmMatrix* b = build(right, known_b);
        for (const Shape into : kGeneralShapes) expect_product(a, b, product(known_a, known_b), into, false);
        destroy(a);
        destroy(b);
      }
    }
}

TEST_P(ProductTest, larger_matrices_are_multiplied_whole) {
  Random random(3);
  for (const Operand& left : all_operands())
    for (const Operand& right : all_operands()) {
      if (!multiplies(left.shape, right.shape)) continue;
      if (left.state > SM_STATE_REORDERED || right.state > SM_STATE_REORDERED) continue;
      const Known known_a = random_known(random, left.shape, 23, 23);
      const Known known_b = random_known(random, right.shape, 23, 23);
      SmMatrix* a = build(left, known_a);
      SmMatrix* b = build(right, known_b);
      SmMatrix* c = typed(kGeneralSparse);
      ASSERT_EQ(qxsmmultm(a, b, c, 0), SM_OK);
      EXPECT_TRUE(same(read(c), product(known_a, known_b))) << name_of(left) << " times " << name_of(right);
      for (SmMatrix* m : {a, b, c}) destroy(m);
    }
}

TEST_P(ProductTest, of_two_general_sparse_matrices_stores_every_place_that_was_met) {
  for (std::uint64_t seed = 0; seed < 20; ++seed) {
    Random random(seed);
    const std::int64_t rows = 1 + random.below(6);
    const std::int64_t n = 1 + random.below(6);
    const std::int64_t cols = 1 + random.below(6);
    const Known known_a = random_known(random, kGeneralSparse, rows, n);
    const Known known_b = random_known(random, kGeneralSparse, n, cols);
    SmMatrix* c = typed(kGeneralSparse);
    ASSERT_EQ(qxsmmultm(build(kGeneralSparse, known_a), build(kGeneralSparse, known_b), c, 0), SM_OK);
    EXPECT_TRUE(same_entries(read(c), product(known_a, known_b)));
    ASSERT_EQ(fn().qxsmclose(c, 0.0), SM_OK);
    EXPECT_TRUE(same(read(c), product(known_a, known_b)));
  }
}

TEST_P(ProductTest, a_matrix_may_be_multiplied_by_itself) {
  Random random(4);
  for (const Operand& operand : all_operands()) {
    const Known known = random_known(random, operand.shape, 5, 5);
    SmMatrix* a = build(operand, known);
    SmMatrix* c = typed(kGeneralRows);
    ASSERT_EQ(qxsmmultm(a, a, c, 0), SM_OK);
    EXPECT_TRUE(same(read(c), product(known, known))) << name_of(operand);
  }
}

TEST_P(ProductTest, stored_zeros_meet_infinities_and_nans) {
  for (const Operand& left : all_operands())
    for (const Operand& right : all_operands()) {
      if (!multiplies(left.shape, right.shape)) continue;
      if (left.state > SM_STATE_REORDERED || right.state > SM_STATE_REORDERED) continue;
      for (const double special : {kInfinity, kNan}) {
        SCOPED_TRACE(name_of(left) + " times " + name_of(right));
        Random random(6);
        Known known_a = random_known(random, left.shape, 4, 4);
        Known known_b = random_known(random, right.shape, 4, 4);
        const std::int64_t j = diagonal(right.shape) ? 1 : 2;
        known_a.set(1, 1, 0.0);
        if (diagonal(right.shape)) {
          known_b.set(1, 1, special);
        } else if (right.shape.kind == SM_KIND_SYMMETRIC) {
          known_b.set_both(1, 2, special);
        } else {
          known_b.set(1, 2, special);
        }
        SmMatrix* c = typed(kGeneralColumns);
        ASSERT_EQ(qxsmmultm(build(left, known_a), build(right, known_b), c, 0), SM_OK);
        const Known want = product(known_a, known_b);
        EXPECT_TRUE(same(read(c), want));
        EXPECT_TRUE(std::isnan(want(1, j)));
        SmMatrix* d = typed(kGeneralSparse);
        ASSERT_EQ(qxsmmultm(build(left, known_a), build(right, known_b), d, 0), SM_OK);
        EXPECT_TRUE(same(read(d), want));
      }
    }
}

TEST_P(ProductTest, infinities_and_nans_of_the_left_matrix_meet_stored_zeros_of_the_right) {
  for (const Operand& left : all_operands())
    for (const Operand& right : all_operands()) {
      if (!multiplies(left.shape, right.shape)) continue;
      if (left.state > SM_STATE_REORDERED || right.state > SM_STATE_REORDERED) continue;
      SCOPED_TRACE(name_of(left) + " times " + name_of(right));
      Random random(7);
      Known known_a = random_known(random, left.shape, 4, 4);
      Known known_b = random_known(random, right.shape, 4, 4);
      known_a.set(1, 1, kInfinity);
      known_b.set(1, 1, 0.0);
      SmMatrix* c = typed(kGeneralRows);
      ASSERT_EQ(qxsmmultm(build(left, known_a), build(right, known_b), c, 0), SM_OK);
      const Known want = product(known_a, known_b);
      EXPECT_TRUE(same(read(c), want));
      EXPECT_TRUE(std::isnan(want(1, 1)));
    }
}

}  // namespace
}  // namespace sm::test
