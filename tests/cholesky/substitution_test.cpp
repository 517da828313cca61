// Solves of one and of many right-hand sides with a sparse factor, with each set of vectors that the CPU has.
#include "cholesky/substitution.hpp"

#include <cmath>

#include "cholesky/cholesky_support.hpp"
#include "cholesky/tiles.hpp"

namespace sm::test {
namespace {

constexpr TileSet kSets[] = {TileSet::avx512, TileSet::avx2, TileSet::portable};

class SubstitutionTest : public ModuleTest {
 protected:
  void TearDown() override {
    if (!use_tiles(TileSet::avx512) && !use_tiles(TileSet::avx2)) use_tiles(TileSet::portable);
    ModuleTest::TearDown();
  }
  std::vector<double> solve(SmMatrix* m, const std::vector<double>& b) {
    // One more column, to see that nothing is written behind the last; and at an odd address, since callers may.
    std::vector<double> x(b.size() + at(m->rows) + 1, 0.25);
    EXPECT_EQ(qxsmsubst(m, b.data(), x.data() + 1, static_cast<std::int32_t>(b.size() / at(m->rows))), SM_OK);
    EXPECT_EQ(x.front(), 0.25) << "before the first vector";
    for (std::size_t i = b.size() + 1; i < x.size(); ++i) EXPECT_EQ(x[i], 0.25) << "behind the last vector";
    return {x.begin() + 1, x.begin() + 1 + static_cast<std::ptrdiff_t>(b.size())};
  }
  // U'DU X = B by plain loops over the stored factor, in long double.
  static std::vector<double> by_loops(const SmMatrix* m, const std::vector<double>& b) {
    const Dense u = stored_u(m);
    const std::vector<double> reciprocal = stored_reciprocals(m);
    const std::int64_t n = m->rows;
    std::vector<double> x(b.size());
    for (std::int64_t v = 0; v * n < static_cast<std::int64_t>(b.size()); ++v) {
      std::vector<long double> w(at(n));
      for (std::int64_t k = 0; k < n; ++k) w[at(k)] = b[at(v * n + m->perm[k])];
      for (std::int64_t k = 0; k < n; ++k)
        for (std::int64_t j = k + 1; j < n; ++j) w[at(j)] -= u(k, j) * w[at(k)];
      for (std::int64_t k = n - 1; k >= 0; --k) {
        w[at(k)] *= reciprocal[at(k)];
        for (std::int64_t j = k + 1; j < n; ++j) w[at(k)] -= u(k, j) * w[at(j)];
        x[at(v * n + m->perm[k])] = static_cast<double>(w[at(k)]);
      }
    }
    return x;
  }
  void check(const Problem& problem, Random& random, std::int64_t count, bool definite) {
    if (problem.n == 0) return;
    SmMatrix* m = new_sparse(session(), problem);
    ASSERT_EQ(fn().qxsmfact(m, 0), SM_OK);
    const std::vector<double> b = random.vector(problem.n * count);
    const std::vector<double> want = by_loops(m, b);
    std::vector<double> first;
    for (const TileSet set : kSets) {
      if (!use_tiles(set)) continue;
      const std::vector<double> x = solve(m, b);
      EXPECT_TRUE(near(x, want, 1e-11)) << tile_kernels().name;
      if (definite) {
        EXPECT_TRUE(near(product(problem.dense(), columns(x, problem.n)), columns(b, problem.n), 1e-10));
      }
      if (first.empty()) first = x;
      EXPECT_EQ(bits(x), bits(first)) << "the same bits with " << tile_kernels().name;
    }
    ASSERT_EQ(fn().qxsmDestroyMatrix(instance(), &m), SM_OK);
  }
};
INSTANTIATE_BOTH_HOSTS(SubstitutionTest);

TEST_P(SubstitutionTest, solves_any_number_of_right_hand_sides) {
  for (std::uint64_t seed = 0; seed < 120; ++seed) {
    SCOPED_TRACE(seed);
    Random random(seed);
    check(positive_definite(any_graph(random, 40), random), random, 1 + random.below(40), true);
  }
}

TEST_P(SubstitutionTest, solves_through_blocks_of_every_width) {
  Random random(3);
  for (std::int64_t n = 1; n <= 40; ++n) check(positive_definite(clique(n), random), random, 9, true);
  for (std::int64_t border = 1; border <= 20; ++border) {
    check(positive_definite(arrowhead(30, border), random), random, 17, true);
  }
}

TEST_P(SubstitutionTest, leaves_dropped_pivots_out) {
  for (std::uint64_t seed = 0; seed < 60; ++seed) {
    SCOPED_TRACE(seed);
    Random random(seed);
    check(cross_product(random, 2 + random.below(20), random.below(8), random.below(4)).problem, random, 11, false);
  }
}

}  // namespace
}  // namespace sm::test
