// Products of general sparse matrices whose nodes stand in memory in any order, and of many vectors at once.
#include <cmath>

#include "forms/blocks.hpp"

namespace sm::test {
namespace {

class TreeMultiplyTest : public FormsTest {
 protected:
  // Enters the elements row by row, or in random order, some of them only to be taken out again.
  SmMatrix* entered(Random& random, const Known& known, bool in_order);
  static std::vector<double> transposed_times(const Known& known, const std::vector<double>& x, std::int64_t k,
                                              std::vector<double> y);
};
INSTANTIATE_BOTH_HOSTS(TreeMultiplyTest);

SmMatrix* TreeMultiplyTest::entered(Random& random, const Known& known, bool in_order) {
  SmMatrix* m = sized(kGeneralSparse, known.rows(), known.cols());
  const std::int64_t places = known.rows() * known.cols();
  std::vector<std::int64_t> order(at(places));
  for (std::int64_t k = 0; k < places; ++k) order[at(k)] = k;
  if (!in_order) order = random.permutation(places);
  for (const std::int64_t place : order) {
    const std::int64_t r = place / known.cols(), c = place % known.cols();
    if (known.has(r, c)) {
      EXPECT_EQ(fn().qxsmassign(m, r, c, 0, known(r, c)), SM_OK);
    } else if (!in_order && random.chance(10)) {
      EXPECT_EQ(fn().qxsmassign(m, r, c, 0, kNan), SM_OK);
      EXPECT_EQ(qxsmremove(m, r, c), SM_OK);
    }
  }
  return m;
}

std::vector<double> TreeMultiplyTest::transposed_times(const Known& known, const std::vector<double>& x, std::int64_t k,
                                                       std::vector<double> y) {
  for (std::int64_t v = 0; v < k; ++v)
    for (std::int64_t r = 0; r < known.rows(); ++r)
      for (std::int64_t c = 0; c < known.cols(); ++c) {
        const double t = x[at(v * known.rows() + r)];
        if (known.has(r, c) && t != 0.0) y[at(v * known.cols() + c)] += known(r, c) * t;
      }
  return y;
}

constexpr std::int64_t kCounts[] = {0, 1, 2, 3, 7, 8, 9, 12, 19};

TEST_P(TreeMultiplyTest, any_order_of_the_nodes_and_any_number_of_vectors_give_the_block_of_the_elements) {
  for (std::uint64_t seed = 0; seed < 24; ++seed) {
    SCOPED_TRACE(seed);
    Random random(300 + seed);
    const std::int64_t rows = 1 + random.below(70), cols = 1 + random.below(70);
    const Known known = random_known(random, kGeneralSparse, rows, cols);
    SmMatrix* m = entered(random, known, seed % 3 == 0);
    for (const std::int64_t k : kCounts) {
      const std::int64_t r0 = random.below(rows), c0 = random.below(cols);
      for (const Block& b : {Block{0, rows - 1, 0, cols - 1},
                             Block{r0, r0 + random.below(rows - r0), c0, c0 + random.below(cols - c0)}}) {
        SCOPED_TRACE(name_of(b) + " for " + std::to_string(k));
        const std::vector<double> x = random.vector(b.width() * k);
        const std::vector<double> before = random.vector(b.height() * k);
        for (const std::int32_t accumulate : {0, 1}) {
          Output y(before);
          ASSERT_EQ(qxsmmultv(m, x.data(), y.data(), b.r0, b.r1, b.c0, b.c1, k, accumulate), SM_OK);
          const std::vector<double> start = accumulate ? before : std::vector<double>(before.size());
          ASSERT_TRUE(same(y.values(), block_times(kGeneralSparse, known, b, x, k, start)));
        }
      }
    }
    destroy(m);
  }
}

TEST_P(TreeMultiplyTest, rows_that_meet_a_zero_are_left_out_of_the_transposed_product_for_that_vector_alone) {
  for (std::uint64_t seed = 0; seed < 24; ++seed) {
    SCOPED_TRACE(seed);
    Random random(400 + seed);
    const std::int64_t rows = 1 + random.below(60), cols = 1 + random.below(60);
    Known known = random_known(random, kGeneralSparse, rows, cols);
    const std::int64_t bad = random.below(rows);
    for (std::int64_t c = 0; c < cols; ++c) {
      if (known.has(bad, c)) known.set(bad, c, kInfinity);
    }
    SmMatrix* m = entered(random, known, seed % 3 == 0);
    for (const std::int64_t k : kCounts) {
      std::vector<double> x = random.vector(rows * k);
      for (std::int64_t v = 0; v < k; ++v) {
        for (std::int64_t r = 0; r < rows; ++r) {
          if (random.chance(30) || (r == bad && v % 3 != 2)) x[at(v * rows + r)] = v % 2 ? -0.0 : 0.0;
        }
      }
      const std::vector<double> before = random.vector(cols * k);
      for (const std::int32_t accumulate : {0, 1}) {
        Output y(before);
        ASSERT_EQ(qxsmvmult(x.data(), m, y.data(), k, accumulate), SM_OK);
        const std::vector<double> start = accumulate ? before : std::vector<double>(before.size());
        ASSERT_TRUE(same(y.values(), transposed_times(known, x, k, start))) << k;
      }
    }
    destroy(m);
  }
}

TEST_P(TreeMultiplyTest, a_symmetric_sparse_matrix_gives_each_of_many_vectors_what_it_gives_it_alone) {
  for (std::uint64_t seed = 0; seed < 20; ++seed) {
    SCOPED_TRACE(seed);
    Random random(500 + seed);
    const std::int64_t n = seed < 3 ? static_cast<std::int64_t>(seed + 1) : 1 + random.below(90);
    const Known known = random_known(random, kSymmetricSparse, n, n);
    SmMatrix* m = build(kSymmetricSparse, known);
    for (const std::int64_t k : kCounts) {
      const std::vector<double> x = random.vector(n * k);
      const std::vector<double> before = random.vector(n * k);
      for (const std::int32_t accumulate : {0, 1}) {
        const std::vector<double> start = accumulate ? before : std::vector<double>(before.size());
        const std::vector<double> want = block_times(kSymmetricSparse, known, {0, n - 1, 0, n - 1}, x, k, start);
        Output y(before);
        ASSERT_EQ(qxsmmultv(m, x.data(), y.data(), 0, n - 1, 0, n - 1, k, accumulate), SM_OK);
        ASSERT_TRUE(same(y.values(), want)) << k;
        Output z(before);
        ASSERT_EQ(qxsmvmult(x.data(), m, z.data(), k, accumulate), SM_OK);
        ASSERT_TRUE(same(z.values(), want)) << k;
      }
    }
    destroy(m);
  }
}

}  // namespace
}  // namespace sm::test
