// The blocked road of ginverse2 held to the plain one and to dense references, with each set of tile kernels.
#include <cmath>
#include <functional>

#include "cholesky/cholesky_support.hpp"
#include "cholesky/ginverse2.hpp"
#include "cholesky/packed_roads.hpp"
#include "cholesky/slabs.hpp"

namespace sm::test {
namespace {

constexpr TileSet kSets[] = {TileSet::avx512, TileSet::avx2, TileSet::portable};
constexpr std::int32_t kFormats[] = {SM_FORMAT_COLUMNS, SM_FORMAT_ROWS};
constexpr std::int32_t kModes[] = {kPackedInverse, kPackedFactor, kPackedFactorToInverse};
constexpr double kTolerance = 1e-9;

using Road = SmStatus (*)(MemoryPool*, const PackedJob&, PackedReport&);

struct Outcome {
  SmStatus status = SM_OK;
  std::vector<double> array;
  PackedReport report;
};

// Both triangles of a symmetric matrix, exact in double.
using Matrix = std::vector<std::vector<double>>;

Matrix zeros(std::int64_t n) { return Matrix(at(n), std::vector<double>(at(n))); }

std::vector<double> packed_of(const Matrix& a, std::int32_t format) {
  const auto n = static_cast<std::int64_t>(a.size());
  std::vector<double> array(at(n * (n + 1) / 2));
  for (std::int64_t r = 0; r < n; ++r)
    for (std::int64_t c = r; c < n; ++c) array[at(packed_position(n, format, r, c))] = a[at(r)][at(c)];
  return array;
}

Dense dense_of(const Matrix& a) {
  const auto n = static_cast<std::int64_t>(a.size());
  Dense d(n, n);
  for (std::int64_t r = 0; r < n; ++r)
    for (std::int64_t c = 0; c < n; ++c) d(r, c) = static_cast<long double>(a[at(r)][at(c)]);
  return d;
}

// Dense and diagonally dominant.
Matrix definite(std::int64_t n, std::uint64_t seed) {
  Random random(seed);
  Matrix a = zeros(n);
  for (std::int64_t r = 0; r < n; ++r) {
    a[at(r)][at(r)] = 8.0 * static_cast<double>(n) + random.dyadic();
    for (std::int64_t c = r + 1; c < n; ++c) a[at(r)][at(c)] = a[at(c)][at(r)] = random.dyadic();
  }
  return a;
}

// The cross-product of columns of which those in `copies` repeat an earlier one, or are 0 when there is none: exactly
// those pivots are dropped.
Matrix semidefinite(std::int64_t n, const Indices& copies, std::uint64_t seed) {
  Random random(seed);
  const Matrix base = definite(n, seed);
  Indices from = natural_order(n);
  for (const std::int64_t k : copies) from[at(k)] = -1;
  Indices kept;
  for (std::int64_t k = 0; k < n; ++k) {
    if (from[at(k)] >= 0) {
      kept.push_back(k);
    } else if (!kept.empty()) {
      from[at(k)] = kept[at(random.below(static_cast<std::int64_t>(kept.size())))];
    }
  }
  Matrix a = zeros(n);
  for (std::int64_t r = 0; r < n; ++r)
    for (std::int64_t c = 0; c < n; ++c)
      if (from[at(r)] >= 0 && from[at(c)] >= 0) a[at(r)][at(c)] = base[at(from[at(r)])][at(from[at(c)])];
  return a;
}

Indices range(std::int64_t first, std::int64_t end) {
  Indices r;
  for (std::int64_t k = first; k < end; ++k) r.push_back(k);
  return r;
}

class BlockedInverseTest : public ModuleTest {
 protected:
  void TearDown() override {
    if (!use_tiles(TileSet::avx512) && !use_tiles(TileSet::avx2)) use_tiles(TileSet::portable);
    ModuleTest::TearDown();
  }
  Outcome run(Road road, std::vector<double> array, std::int64_t n, std::int32_t mode, std::int32_t format) {
    Outcome out;
    out.array = std::move(array);
    const PackedJob job = {out.array.data(), n, format, mode, kTolerance};
    const std::int64_t blocks = host().live_blocks();
    out.status = road(instance()->pool, job, out.report);
    EXPECT_EQ(host().live_blocks(), blocks);
    return out;
  }
  void with_each_set(const std::function<void()>& check) {
    int sets = 0;
    for (const TileSet set : kSets) {
      if (!use_tiles(set)) continue;
      SCOPED_TRACE(tile_kernels().name);
      check();
      ++sets;
    }
    EXPECT_GE(sets, 1);
  }
  // Every mode and format by both roads. Elements agree relative to the largest; the rows of dropped pivots are 0.
  void compare(const Matrix& a, const Indices& dropped) {
    const auto n = static_cast<std::int64_t>(a.size());
    const std::int64_t rank = n - static_cast<std::int64_t>(dropped.size());
    for (const std::int32_t format : kFormats) {
      const std::vector<double> matrix = packed_of(a, format);
      const Outcome factor = run(ginverse2_by_columns, matrix, n, kPackedFactor, format);
      ASSERT_EQ(factor.status, SM_OK);
      for (const std::int32_t mode : kModes) {
        SCOPED_TRACE(testing::Message() << "order " << n << ", format " << format << ", mode " << mode);
        const std::vector<double>& given = mode == kPackedFactorToInverse ? factor.array : matrix;
        const Outcome want = run(ginverse2_by_columns, given, n, mode, format);
        with_each_set([&] {
          const Outcome got = run(ginverse2_in_slabs, given, n, mode, format);
          expect_same(got, want, rank);
          for (const std::int64_t k : dropped)
            for (std::int64_t j = mode == kPackedFactor ? k : 0; j < n; ++j)
              ASSERT_EQ(got.array[at(packed_position(n, format, std::min(j, k), std::max(j, k)))], 0.0) << "row " << k;
        });
      }
    }
  }

 private:
  static void expect_same(const Outcome& got, const Outcome& want, std::int64_t rank) {
    ASSERT_EQ(got.status, SM_OK);
    EXPECT_EQ(want.report.rank, rank);
    EXPECT_EQ(got.report.rank, rank);
    EXPECT_NEAR(got.report.log_det, want.report.log_det, 1e-10 * (1.0 + std::fabs(want.report.log_det)));
    double scale = 0.0;
    for (const double v : want.array) scale = std::fmax(scale, std::fabs(v));
    for (std::size_t p = 0; p < want.array.size(); ++p) {
      if (std::isnan(want.array[p])) {
        ASSERT_TRUE(std::isnan(got.array[p])) << "position " << p << ": " << got.array[p];
      } else {
        ASSERT_NEAR(got.array[p], want.array[p], 1e-12 * scale) << "position " << p;
      }
    }
  }
};
INSTANTIATE_BOTH_HOSTS(BlockedInverseTest);

TEST_P(BlockedInverseTest, both_roads_agree_on_definite_matrices_of_any_order) {
  for (std::int64_t n = 0; n <= 50; ++n) compare(definite(n, 3), {});
  for (const std::int64_t border : {kBand, 2 * kBand, 3 * kBand})
    for (const std::int64_t n : {border - 1, border, border + 1, border + kSlab + 5}) compare(definite(n, 4), {});
}

TEST_P(BlockedInverseTest, the_factor_and_both_inverses_satisfy_their_definitions) {
  for (const std::int64_t n : {kBand + 7, 2 * kBand + 13}) {
    const Matrix matrix = definite(n, 5);
    const Dense a = dense_of(matrix);
    const auto log_det = static_cast<double>(log_determinant(a));
    for (const std::int32_t format : kFormats)
      with_each_set([&] {
        const Outcome factor = run(ginverse2_in_slabs, packed_of(matrix, format), n, kPackedFactor, format);
        const Dense r = triangle_of_packed(factor.array.data(), n, format);
        EXPECT_TRUE(near(product(transposed(r), r), a, 1e-14));
        EXPECT_NEAR(factor.report.log_det, log_det, 1e-12 * std::fabs(log_det));
        const Outcome direct = run(ginverse2_in_slabs, packed_of(matrix, format), n, kPackedInverse, format);
        const Outcome second = run(ginverse2_in_slabs, factor.array, n, kPackedFactorToInverse, format);
        for (const Outcome* g : {&direct, &second}) {
          EXPECT_TRUE(near(product(dense_of_packed(g->array.data(), n, format), a), identity(n), 1e-13));
          EXPECT_EQ(g->report.rank, n);
          EXPECT_NEAR(g->report.log_det, log_det, 1e-12 * std::fabs(log_det));
        }
      });
  }
}

TEST_P(BlockedInverseTest, pivots_are_dropped_anywhere_as_on_the_plain_road) {
  const std::vector<Indices> cases = {
      {0},
      {1, 2, 5},
      {7, 8},
      {23, 24, 25},
      range(8, 16),
      range(0, 24),
      {kBand - 1, kBand, kBand + 1},
      range(kBand - 8, kBand),
      range(kBand, 2 * kBand),
      {2 * kBand - 1, 2 * kBand, 2 * kBand + 20},
      range(1, 2 * kBand + 21),
      range(0, 2 * kBand + 21),
  };
  const std::int64_t n = 2 * kBand + 21;
  for (std::size_t i = 0; i < cases.size(); ++i) {
    SCOPED_TRACE(testing::Message() << "case " << i);
    compare(semidefinite(n, cases[i], 6), cases[i]);
  }
}

TEST_P(BlockedInverseTest, random_drops_give_the_inverse_of_the_accepted_block) {
  for (std::uint64_t seed = 0; seed < 6; ++seed) {
    Random random(seed);
    const std::int64_t n = kBand + 1 + random.below(2 * kBand);
    Indices copies;
    for (std::int64_t k = 0; k < n; ++k)
      if (random.chance(30)) copies.push_back(k);
    const Matrix matrix = semidefinite(n, copies, seed);
    compare(matrix, copies);
    std::vector<bool> accepted(at(n), true);
    for (const std::int64_t k : copies) accepted[at(k)] = false;
    const Dense want = inverse(principal(dense_of(matrix), accepted));
    for (const std::int32_t format : kFormats)
      with_each_set([&] {
        const Outcome out = run(ginverse2_in_slabs, packed_of(matrix, format), n, kPackedInverse, format);
        const Dense g = dense_of_packed(out.array.data(), n, format);
        EXPECT_TRUE(near(principal(g, accepted), want, 1e-14)) << "seed " << seed;
        for (const std::int64_t k : copies)
          for (std::int64_t j = 0; j < n; ++j) ASSERT_EQ(g(k, j), 0.0L) << "seed " << seed << ", dropped " << k;
      });
  }
}

TEST_P(BlockedInverseTest, a_row_that_is_not_a_number_is_dropped_without_touching_the_others) {
  const std::int64_t n = kBand + 30;
  for (const std::int64_t k : {std::int64_t{0}, std::int64_t{3}, kBand - 3, kBand, n - 1}) {
    Matrix a = definite(n, 7);
    for (std::int64_t j = 0; j < n; ++j) a[at(k)][at(j)] = a[at(j)][at(k)] = std::nan("");
    SCOPED_TRACE(testing::Message() << "row " << k);
    compare(a, {k});
  }
}

TEST_P(BlockedInverseTest, a_row_of_a_factor_below_a_diagonal_that_is_not_positive_counts_as_zero) {
  const std::int64_t n = kBand + 30;
  for (const double diagonal : {0.0, -2.0})
    for (const std::int64_t k : {std::int64_t{2}, kBand - 2, kBand + 1})
      for (const std::int32_t format : kFormats) {
        std::vector<double> r =
            run(ginverse2_by_columns, packed_of(definite(n, 8), format), n, kPackedFactor, format).array;
        for (std::int64_t c = k; c < n; ++c) r[at(packed_position(n, format, k, c))] = c == k ? diagonal : 0.0;
        const Outcome want = run(ginverse2_by_columns, r, n, kPackedFactorToInverse, format);
        with_each_set([&] {
          const Outcome got = run(ginverse2_in_slabs, r, n, kPackedFactorToInverse, format);
          EXPECT_EQ(got.report.rank, n - 1);
          EXPECT_NEAR(got.report.log_det, want.report.log_det, 1e-10);
          EXPECT_TRUE(near(got.array, want.array, 1e-13));
        });
      }
}

TEST_P(BlockedInverseTest, a_bad_pivot_anywhere_answers_103_and_leaves_everything) {
  const std::int64_t n = 2 * kBand + 30;
  for (const std::int64_t k : {std::int64_t{0}, std::int64_t{9}, kBand - 1, kBand, 2 * kBand + 1, n - 1}) {
    Matrix a = definite(n, 9);
    a[at(k)][at(k)] = -1.0;
    for (const std::int32_t mode : {kPackedInverse, kPackedFactor})
      for (const std::int32_t format : kFormats)
        with_each_set([&] {
          std::vector<double> array = packed_of(a, format);
          double log_det = -7.0;
          i64 rank = -8;
          std::int16_t flag = -9;
          EXPECT_EQ(ginverse2(instance(), array.data(), n, &log_det, &rank, mode, kTolerance, format, &flag),
                    SM_NOT_DEFINITE)
              << "pivot " << k;
          EXPECT_EQ(bits(array), bits(packed_of(a, format)));
          EXPECT_EQ(log_det, -7.0);
          EXPECT_EQ(rank, -8);
          EXPECT_EQ(flag, 0);
        });
  }
}

TEST_P(BlockedInverseTest, a_refused_block_answers_101_and_leaves_everything) {
  const std::int64_t n = kBand + 30;
  const Matrix a = definite(n, 10);
  for (const std::int32_t mode : kModes)
    for (const std::int32_t format : kFormats)
      for (std::int64_t k = 0;; ++k) {
        std::vector<double> array = packed_of(a, format);
        double log_det = -7.0;
        i64 rank = -8;
        std::int16_t flag = -9;
        host().fail_request(k, false);
        const SmStatus status =
            ginverse2(instance(), array.data(), n, &log_det, &rank, mode, kTolerance, format, &flag);
        if (host().stop_failing() == 0) {
          EXPECT_GE(k, 1);
          EXPECT_EQ(status, SM_OK);
          EXPECT_EQ(rank, n);
          EXPECT_EQ(flag, 1);
          break;
        }
        EXPECT_EQ(status, SM_NO_MEMORY);
        EXPECT_EQ(bits(array), bits(packed_of(a, format)));
        EXPECT_EQ(log_det, -7.0);
        EXPECT_EQ(rank, -8);
        EXPECT_EQ(flag, -9);
        ASSERT_LT(k, 100);
      }
}

TEST(SinglePivot, is_inverted_and_judged_as_a_matrix_of_order_1) {
  constexpr double kBefore = -77.0;
  SmInstance instance{};
  Random random(17);
  std::vector<double> elements = {0.0,        -0.0, 1e-300,  -1e-300, 1e300, kInfinity,
                                  -kInfinity, kNan, -0.0625, -0.125,  -1.0};
  for (int k = 0; k < 100; ++k) elements.push_back(std::fabs(random.dyadic()) / 3.0);
  for (const double tolerance : {1e-12, 0.5, 2.0, 0.0})
    for (const double a : elements) {
      double array = a, log_det = 0.0, inverse = kBefore;
      std::int64_t rank = 0;
      std::int16_t definite = 0;
      const SmStatus want =
          ginverse2(&instance, &array, 1, &log_det, &rank, kPackedInverse, tolerance, SM_FORMAT_ROWS, &definite);
      EXPECT_EQ(invert_pivot(a, tolerance, inverse), want) << a;
      EXPECT_EQ(bits(inverse), bits(want == SM_OK ? array : kBefore)) << a << " with " << tolerance;
    }
}

}  // namespace
}  // namespace sm::test
