// Closing against a map: compressed rows and dropped trees of random matrices.
#include <gtest/gtest.h>

#include <cmath>

#include "store/store_test.hpp"
#include "support/random_matrices.hpp"

namespace sm::test {
namespace {

class ClosingRandom : public StoreTest {};

// What is left of a model; the diagonal of a symmetric matrix of order n stays, at zero when it is small.
Nonzeros dropped(const Nonzeros& model, double tolerance, std::int64_t symmetric_n) {
  Nonzeros out;
  for (const auto& [place, value] : model) {
    if (!(std::fabs(value) <= tolerance)) out[place] = value;
  }
  for (std::int64_t i = 0; i < symmetric_n; ++i) out.try_emplace({i, i}, 0.0);
  return out;
}

TEST_P(ClosingRandom, compressed_rows_hold_what_the_trees_held) {
  for (std::uint64_t seed = 1; seed <= 20; ++seed) {
    SCOPED_TRACE(seed);
    Random random(seed);
    const std::int64_t n = 1 + random.below(60);
    SmMatrix* m = square(kSymmetricSparse, n);
    Nonzeros model;
    const std::int64_t steps = random.below(4 * n * n + 1);
    for (std::int64_t step = 0; step < steps; ++step) {
      std::int64_t r = random.below(n);
      std::int64_t c = random.below(n);
      if (r > c) std::swap(r, c);
      const double value = random.dyadic();
      ASSERT_EQ(fn().qxsmassign(m, r, c, 1, value), SM_OK);
      model[{r, c}] += value;
    }
    const double tolerances[] = {0.0, 1.0 / 64.0, 2.0, 1e9, kNan};
    const double tolerance = tolerances[seed % 5];
    ASSERT_EQ(fn().qxsmclose(m, tolerance), SM_OK);
    const Nonzeros expected = dropped(model, tolerance, n);
    EXPECT_EQ(compressed(m), expected);
    for (std::int64_t r = 0; r < n; ++r) {
      for (std::int64_t c = r; c < n; ++c) {
        const auto found = expected.find({r, c});
        ASSERT_EQ(at(m, r, c), found == expected.end() ? 0.0 : found->second) << r << ' ' << c;
      }
    }
  }
}

// Rows long enough for the trees to be walked in parts and for the tree extension to keep one by key.
TEST_P(ClosingRandom, long_rows_filled_in_random_order_hold_what_a_map_holds) {
  for (const double tolerance : {0.0, 1.0, kNan}) {
    SCOPED_TRACE(tolerance);
    Random random(31);
    constexpr std::int64_t n = 12'000;
    SmMatrix* m = square(kSymmetricSparse, n);
    Nonzeros model;
    for (std::int64_t step = 0; step < 30'000; ++step) {
      const std::int64_t r = step % 3 == 0 ? random.below(40) : 5 * random.below(2);
      const std::int64_t c = r + random.below(n - r);
      const double value = random.dyadic();
      ASSERT_EQ(fn().qxsmassign(m, r, c, 1, value), SM_OK);
      model[{r, c}] += value;
    }
    ASSERT_EQ(fn().qxsmclose(m, tolerance), SM_OK);
    EXPECT_EQ(compressed(m), dropped(model, tolerance, n));
    EXPECT_EQ(fn().qxsmDestroyMatrix(instance(), &m), SM_OK);
  }
}

TEST_P(ClosingRandom, a_diagonal_longer_than_a_slab_is_closed_whole) {
  constexpr std::int64_t n = 1'000'030;
  SmMatrix* m = square(kSymmetricSparse, n);
  ASSERT_LT(m->slab_nodes, n);
  ASSERT_EQ(set(m, 7, n + 4, 2.0), SM_OK) << "and grows";
  ASSERT_EQ(add(m, n - 1, n - 1, 3.0), SM_OK);
  ASSERT_EQ(add(m, n - 40, n - 2, 4.0), SM_OK);
  ASSERT_EQ(fn().qxsmclose(m, 0.0), SM_OK);
  ASSERT_EQ(m->nnz, n + 5 + 2);
  for (std::int64_t i = 0; i < n + 5; ++i) ASSERT_EQ(m->col_index[m->row_start[i]], i);
  EXPECT_EQ(m->row_start[n + 5], m->nnz);
  EXPECT_EQ(at(m, 7, n + 4), 2.0);
  EXPECT_EQ(at(m, n - 1, n - 1), 3.0);
  EXPECT_EQ(at(m, n - 40, n - 2), 4.0);
}

TEST_P(ClosingRandom, trees_lose_what_is_small_and_nothing_else) {
  for (std::uint64_t seed = 50; seed < 62; ++seed) {
    SCOPED_TRACE(seed);
    Random random(seed);
    const std::int64_t rows = 1 + random.below(30);
    const std::int64_t cols = 1 + random.below(200);
    SmMatrix* m = make(kGeneralSparse, rows, cols);
    Nonzeros model;
    for (std::int64_t step = 0; step < 3 * rows * cols / 2; ++step) {
      const std::int64_t r = random.below(rows);
      const std::int64_t c = random.below(cols);
      const double value = random.dyadic();
      ASSERT_EQ(set(m, r, c, value), SM_OK);
      model[{r, c}] = value;
    }
    m->state = SM_STATE_OPEN;
    const double tolerance = 0.5 * static_cast<double>(random.below(12));
    ASSERT_EQ(fn().qxsmclose(m, tolerance), SM_OK);
    EXPECT_EQ(walk(m, m->row_roots), dropped(model, tolerance, 0));
    EXPECT_EQ(m->state, SM_STATE_CLOSED);
  }
}

TEST_P(ClosingRandom, dense_slots_of_every_count_are_dropped_alike) {
  for (std::int64_t count = 1; count <= 67; ++count) {
    Random random(static_cast<std::uint64_t>(count));
    std::vector<double> mine = random.vector(count);
    mine[static_cast<std::size_t>(random.below(count))] = kNan;
    mine.push_back(0.5);  // the caller's, behind the matrix's last slot
    const std::vector<double> before = mine;
    SmMatrix* m = reset_record();
    ASSERT_EQ(qxsmtie(m, mine.data(), count, count, SM_KIND_DIAGONAL, SM_FORMAT_ROWS), SM_OK);
    ASSERT_EQ(fn().qxsmclose(m, 3.0), SM_OK);
    EXPECT_EQ(mine.back(), 0.5);
    for (std::size_t k = 0; k + 1 < mine.size(); ++k) {
      EXPECT_EQ(bits(mine[k]), std::fabs(before[k]) <= 3.0 ? 0U : bits(before[k])) << count << ' ' << k;
    }
    EXPECT_EQ(fn().qxsmDestroyMatrix(instance(), &m), SM_OK);
  }
}

INSTANTIATE_BOTH_HOSTS(ClosingRandom);

}  // namespace
}  // namespace sm::test
