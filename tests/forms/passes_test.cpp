// The passes over compressed rows, with each set of vectors that the CPU has, against one row after the other.
#include "forms/passes.hpp"

#include <cmath>

#include "cholesky/tiles.hpp"
#include "forms/compressed.hpp"
#include "forms/forms_support.hpp"

namespace sm::test {
namespace {

constexpr TileSet kSets[] = {TileSet::avx512, TileSet::avx2, TileSet::portable};

class PassesTest : public ::testing::Test {
 protected:
  void TearDown() override {
    if (!use_tiles(TileSet::avx512) && !use_tiles(TileSet::avx2)) use_tiles(TileSet::portable);
  }
  // Calls f() once for each set.
  template <class F>
  static void for_sets(F f) {
    for (const TileSet set : kSets) {
      if (!use_tiles(set)) continue;
      SCOPED_TRACE(tile_kernels().name);
      f();
    }
  }
  static void expect_products(Compressed& a, Random& random);
  static void expect_steps(Compressed& a, Random& random);
  static void expect_all(const Pattern& pattern, Random& random) {
    Compressed a(random, pattern);
    expect_products(a, random);
    expect_steps(a, random);
    Compressed b(random, reordered(random, pattern), false);
    expect_products(b, random);
    expect_steps(b, random);
  }
};

// A block that begins at an odd address, with guards on both sides. Everything is a NaN first, so that what is not
// written, or read before it is written, shows.
struct Guarded {
  explicit Guarded(std::int64_t n, double fill = kNan) : v(at(n + 2), fill) { v.front() = v.back() = kUntouched; }
  explicit Guarded(const std::vector<double>& from) : Guarded(static_cast<std::int64_t>(from.size())) {
    std::copy(from.begin(), from.end(), v.begin() + 1);
  }
  double* data() { return v.data() + 1; }
  std::vector<double> values() const {
    EXPECT_EQ(v.front(), kUntouched);
    EXPECT_EQ(v.back(), kUntouched);
    return {v.begin() + 1, v.end() - 1};
  }
  std::vector<double> v;
};

void PassesTest::expect_products(Compressed& a, Random& random) {
  const std::int64_t n = a.n();
  for (int count = 1; count <= kProductLanes; count += count == 3 ? 2 : 1) {
    SCOPED_TRACE(std::to_string(count) + " vectors of " + std::to_string(n));
    Guarded x(random.vector(n * count));
    const std::vector<double> before = random.vector(n * count);
    const std::vector<double> sum = a.plain(x.values(), before, count);
    const std::vector<double> alone = a.plain(x.values(), std::vector<double>(before.size()), count);
    for_sets([&] {
      Guarded y(n * count);
      Guarded z(before);
      if (count == 1) {
        passes().multiply(a.rows(), x.data(), y.data(), false);
        passes().multiply(a.rows(), x.data(), z.data(), true);
      } else {
        if (!a.rows().is_ascending) return;
        passes().multiply_several(a.rows(), x.data(), y.data(), count, false);
        passes().multiply_several(a.rows(), x.data(), z.data(), count, true);
      }
      ASSERT_TRUE(same(y.values(), alone));
      ASSERT_TRUE(same(z.values(), sum));
    });
  }
}

// How the turns of a list take the rows.
struct Covered {
  std::int64_t rows = 0, in_strips = 0, in_batches = 0;
};
Covered covered_by(const Indices& list, std::int64_t n) {
  constexpr std::size_t lengths = 10;  // 0 to 8, and longer
  Covered covered;
  for (std::size_t word = 1; covered.rows < n;) {
    const std::int64_t turn = list.at(word++);
    if (turn != 0) {
      covered.rows += std::abs(turn);
      covered.in_strips += std::max<std::int64_t>(turn, 0);
      continue;
    }
    const std::int64_t rows = list.at(word);
    std::int64_t pieces = 0;
    for (std::size_t length = 0; length < lengths; ++length) pieces += list.at(word + 2 + length);
    word += 2 + lengths + at(pieces + 1) / 2;
    covered.rows += rows;
    covered.in_batches += rows;
  }
  return covered;
}

// The direction that a step takes, where it leads, and the exact residual; sums to rounding, all else to the bit.
void PassesTest::expect_steps(Compressed& a, Random& random) {
  const std::int64_t n = a.n();
  const std::vector<double> inverse = random.vector(n), residual = random.vector(n), first = random.vector(n);
  const double beta = 0.75, alpha = -1.25;
  std::vector<double> p(at(n)), x(at(n)), rest(at(n)), exact(at(n));
  for (std::size_t i = 0; i < p.size(); ++i) p[i] = inverse[i] * residual[i] + beta * first[i];
  const std::vector<double> q = a.plain(p, std::vector<double>(at(n)));
  long double curvature = 0.0L, rho = 0.0L, exact_rho = 0.0L, scale = 1.0L;
  for (std::size_t i = 0; i < p.size(); ++i) {
    x[i] = first[i] + alpha * p[i];
    rest[i] = residual[i] - alpha * q[i];
    exact[i] = first[i] - q[i];
    curvature += static_cast<long double>(p[i]) * q[i];
    rho += static_cast<long double>(rest[i]) * inverse[i] * rest[i];
    exact_rho += static_cast<long double>(exact[i]) * inverse[i] * exact[i];
    scale += std::fabs(p[i] * q[i]) + std::fabs(rest[i] * inverse[i] * rest[i]);
    scale += std::fabs(exact[i] * inverse[i] * exact[i]);
  }
  const double tolerance = static_cast<double>(scale) * 1e-11;
  std::vector<double> sums;
  for_sets([&] {
    Indices list(at(list_words(n)) + 1, -77);
    passes().list_rows(a.rows(), list.data());
    EXPECT_EQ(list.back(), -77);
    Guarded gp(first), gq(n), gx(first), gr(residual), ge(n);
    const double pq = passes().direct(a.rows(), list.data(), {inverse.data(), gr.data(), beta, gp.data(), gq.data()});
    const double measured = passes().measure(n, first.data(), gq.data(), inverse.data(), ge.data());
    const double next = passes().advance({n, alpha, gp.data(), gq.data(), inverse.data(), gx.data(), gr.data()});
    ASSERT_TRUE(same(gp.values(), p));
    ASSERT_TRUE(same(gq.values(), q));
    ASSERT_TRUE(same(gx.values(), x));
    ASSERT_TRUE(same(gr.values(), rest));
    ASSERT_TRUE(same(ge.values(), exact));
    EXPECT_NEAR(pq, static_cast<double>(curvature), tolerance);
    EXPECT_NEAR(next, static_cast<double>(rho), tolerance);
    EXPECT_NEAR(measured, static_cast<double>(exact_rho), tolerance);
    if (sums.empty()) sums = {pq, next, measured};
    EXPECT_EQ(bits(sums), bits(std::vector<double>{pq, next, measured})) << "the same bits on every CPU";
  });
}

TEST_F(PassesTest, any_rows_give_what_one_row_after_the_other_gives) {
  for (std::uint64_t seed = 0; seed < 60; ++seed) {
    SCOPED_TRACE(seed);
    Random random(seed);
    const std::int64_t n = seed < 12 ? static_cast<std::int64_t>(seed / 3) : 1 + random.below(300);
    expect_all(scattered(random, n, random.below(12)), random);
  }
}

TEST_F(PassesTest, rows_that_continue_each_other_and_rows_between_them) {
  for (std::uint64_t seed = 0; seed < 60; ++seed) {
    SCOPED_TRACE(seed);
    Random random(1000 + seed);
    expect_all(patched(random, 20 + random.below(500)), random);
  }
}

TEST_F(PassesTest, stencils_of_every_size) {
  Random random(5);
  for (std::int64_t n = 1; n <= 140; n += n < 40 ? 1 : 7) {
    expect_all(stencil(n, {}), random);
    expect_all(stencil(n, {1}), random);
    expect_all(stencil(n, {1, 2, 30}), random);
    expect_all(stencil(n, {3, 4, 5, 6, 7, 8, 9, 10, 11, 12, 13, 14, 15, 16, 17, 18, 19, 20, 21, 22, 23}), random);
  }
  for (std::int64_t width = 1; width <= 70; width += 3) expect_all(plane(width, 5), random);
}

TEST_F(PassesTest, columns_that_lie_beyond_the_window) {
  Random random(6);
  for (const std::int64_t n : {kProductReach - 1, kProductReach, kProductReach + 1, 2 * kProductReach + 13}) {
    Compressed grid(random, stencil(n, {1, kProductReach - 9, kProductReach - 1, kProductReach, kProductReach + 1}));
    expect_products(grid, random);
    Compressed any(random, scattered(random, n, 3));
    expect_products(any, random);
  }
}

TEST_F(PassesTest, one_full_row_first_or_last) {
  Random random(7);
  for (const std::int64_t n : {2, 9, 300, 3000}) {
    Pattern first = stencil(n, {});
    for (std::int64_t j = 1; j < n; ++j) first[0].push_back(j);
    expect_all(first, random);
    expect_all(stencil(n, {n - 1}), random);
    Pattern last = stencil(n, {});
    for (std::int64_t i = 0; i + 1 < n; ++i) last[i].push_back(n - 1);
    expect_all(last, random);
  }
}

// Row 0 has the columns up to every length around one, two and three runs of neighbours, or misses one of them.
TEST_F(PassesTest, a_row_of_neighbours_that_ends_anywhere_or_misses_one) {
  Random random(10);
  const std::int64_t n = 230;
  for (std::int64_t length = 60; length < n; length += length % 64 < 4 || length % 64 > 60 ? 1 : 9) {
    Pattern ends = stencil(n, {});
    for (std::int64_t j = 1; j < length; ++j) ends[0].push_back(j);
    expect_all(ends, random);
    Pattern misses = stencil(n, {});
    for (std::int64_t j = 1; j < n; ++j) {
      if (j != length) misses[0].push_back(j);
    }
    expect_all(misses, random);
  }
}

TEST_F(PassesTest, a_border_of_rows_that_miss_some_columns) {
  for (std::uint64_t seed = 0; seed < 20; ++seed) {
    SCOPED_TRACE(seed);
    Random random(2000 + seed);
    const std::int64_t n = 100 + random.below(900);
    const std::int64_t missing = seed % 4;  // in a hundred
    Pattern rows = stencil(n, {1, 2});
    for (std::int64_t i = 0; i < 6; ++i) {
      rows[i] = {i};
      for (std::int64_t j = i + 1; j < n; ++j) {
        if (!random.chance(missing)) rows[i].push_back(j);
      }
    }
    expect_all(rows, random);
  }
}

TEST_F(PassesTest, a_list_covers_the_rows_and_finds_the_strips_of_a_grid_and_the_batches_of_a_pedigree) {
  Random random(8);
  struct Wanted {
    Pattern pattern;
    std::int64_t strips, batches;  // per cent of the rows, at least; where 0 almost none
  };
  for (const Wanted& wanted :
       {Wanted{plane(100, 20), 90, 0}, Wanted{plane(12, 100), 65, 0}, Wanted{stencil(1000, {1, 2}), 98, 0},
        Wanted{scattered(random, 500, 12), 0, 0}, Wanted{pedigree(random, 3000), 0, 80}}) {
    Compressed a(random, wanted.pattern);
    for_sets([&] {
      Indices list(at(list_words(a.n())), 0);
      passes().list_rows(a.rows(), list.data());
      const Covered covered = covered_by(list, a.n());
      EXPECT_EQ(covered.rows, a.n());
      EXPECT_GE(100 * covered.in_strips, wanted.strips * a.n());
      EXPECT_LE(covered.in_strips, wanted.strips > 0 ? a.n() : a.n() / 100);
      EXPECT_GE(100 * covered.in_batches, wanted.batches * a.n());
      EXPECT_LE(covered.in_batches, wanted.batches > 0 ? a.n() : 0);
      EXPECT_EQ(list[0], covered.in_batches > 0 ? 1 : 0);
    });
  }
}

TEST_F(PassesTest, rows_of_any_lengths_as_pedigrees_have_them) {
  for (std::uint64_t seed = 0; seed < 40; ++seed) {
    SCOPED_TRACE(seed);
    Random random(3000 + seed);
    expect_all(pedigree(random, seed < 20 ? 30 + random.below(60) : 100 + random.below(900)), random);
  }
}

// Each length alone and in turns with single diagonals, so that batches have nothing else; at the end of the arrays
// too.
TEST_F(PassesTest, rows_of_every_length_up_to_40_between_single_diagonals) {
  Random random(12);
  for (std::int64_t length = 0; length <= 40; ++length) {
    SCOPED_TRACE(length);
    for (const std::int64_t n : {64, 95, 330}) {
      Pattern rows = stencil(n, {});
      for (std::int64_t i = 0; i < n; i += 1 + random.below(3)) {
        std::set<std::int64_t> row = {i};
        while (static_cast<std::int64_t>(row.size()) <= std::min(length, n - i - 1))
          row.insert(i + random.below(n - i));
        rows[at(i)].assign(row.begin(), row.end());
      }
      expect_all(rows, random);
    }
  }
}

// So many that a product cuts them too, and the bits of sums that round.
TEST_F(PassesTest, a_pedigree_that_the_processor_does_not_remember) {
  Random random(13);
  Compressed a(random, pedigree(random, 40'000));
  std::vector<double> before = random.vector(a.n());
  Guarded x(random.vector(a.n()));
  const std::vector<double> exact = a.plain(x.values(), before);
  for_sets([&] {
    Guarded y(before);
    passes().multiply(a.rows(), x.data(), y.data(), true);
    ASSERT_TRUE(same(y.values(), exact));
  });
  for (double& v : a.values()) v = 1.0 / v;
  const std::vector<double> want = a.plain(x.values(), std::vector<double>(before.size()));
  std::vector<double> first;
  for_sets([&] {
    Guarded y(a.n());
    passes().multiply(a.rows(), x.data(), y.data(), false);
    const std::vector<double> got = y.values();
    for (std::size_t i = 0; i < got.size(); ++i) ASSERT_NEAR(got[i], want[i], 1e-11 * (1.0 + std::fabs(want[i])));
    if (first.empty()) first = got;
    ASSERT_EQ(bits(got), bits(first)) << "the same bits on every CPU";
  });
}

TEST_F(PassesTest, infinities_and_nans_reach_the_rows_they_meet_and_no_other) {
  Random random(14);
  for (const std::int64_t n : {300, 40'000}) {
    Compressed a(random, pedigree(random, n));
    std::vector<double> x = random.vector(n);
    for (std::int64_t k = 7; k < n; k += n / 7) x[at(k)] = k % 3 == 0 ? kNan : k % 3 == 1 ? kInfinity : -kInfinity;
    Guarded gx(x);
    const std::vector<double> want = a.plain(x, std::vector<double>(x.size()));
    const auto numbers = [](const std::vector<double>& v) {
      return std::count_if(v.begin(), v.end(), [](double e) { return std::isfinite(e); });
    };
    ASSERT_GT(numbers(want), n / 2);
    ASSERT_LT(numbers(want), n);
    const std::vector<double> inverse(x.size(), 1.0);
    for_sets([&] {
      Guarded y(n), p(n), q(n);
      passes().multiply(a.rows(), gx.data(), y.data(), false);
      ASSERT_TRUE(same(y.values(), want));
      Indices list(at(list_words(n)));
      passes().list_rows(a.rows(), list.data());
      std::fill_n(p.data(), n, 0.0);
      passes().direct(a.rows(), list.data(), {inverse.data(), gx.data(), 0.0, p.data(), q.data()});
      ASSERT_TRUE(same(q.values(), want));
    });
  }
}

TEST_F(PassesTest, sums_that_round_have_the_same_bits_on_every_cpu_and_are_near_those_of_single_rows) {
  Random random(9);
  Pattern border = plane(40, 20);
  for (std::int64_t j = 40; j < 800; ++j) border[3].push_back(j);
  std::sort(border[3].begin(), border[3].end());
  border[3].erase(std::unique(border[3].begin(), border[3].end()), border[3].end());
  for (const Pattern& pattern : {plane(60, 40), scattered(random, 700, 9), patched(random, 900), border}) {
    Compressed a(random, pattern);
    for (double& v : a.values()) v = 1.0 / v;
    std::vector<double> x = random.vector(8 * a.n());
    for (double& v : x) v = 1.0 / (v + 20.0);
    const std::vector<double> want = a.plain(x, std::vector<double>(x.size()), 8);
    std::vector<double> one, several;
    for_sets([&] {
      std::vector<double> y(at(a.n())), z(x.size());
      passes().multiply(a.rows(), x.data(), y.data(), false);
      passes().multiply_several(a.rows(), x.data(), z.data(), 8, false);
      for (std::size_t i = 0; i < z.size(); ++i) {
        ASSERT_NEAR(z[i], want[i], 1e-11 * (1.0 + std::fabs(want[i])));
      }
      for (std::size_t i = 0; i < y.size(); ++i) ASSERT_NEAR(y[i], want[i], 1e-11 * (1.0 + std::fabs(want[i])));
      if (one.empty()) {
        one = y;
        several = z;
      }
      EXPECT_EQ(bits(y), bits(one));
      EXPECT_EQ(bits(z), bits(several));
    });
  }
}

}  // namespace
}  // namespace sm::test
