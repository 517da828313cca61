// Solves of one and of many right-hand sides with a sparse factor, with each set of vectors that the CPU has.
#include "cholesky/substitution.hpp"

#include <algorithm>
#include <cmath>
#include <string>

#include "cholesky/cholesky_support.hpp"
#include "cholesky/tiles.hpp"

namespace sm::test {
namespace {

constexpr TileSet kSets[] = {TileSet::avx512, TileSet::avx2, TileSet::portable};

// Each with `width` coefficients of its own, joined to a border of columns: the first two subjects and those from the
// fifth on to all of it, the others to every second of them. What a subject adds has this rank.
struct Subjects {
  std::int64_t width;
  std::int64_t border;
  std::int64_t rank;
  std::int64_t count = 6;

  [[nodiscard]] std::int64_t rows() const { return count * width + border; }
};

Problem normal_equations(Random& random, const Subjects& s) {
  const std::int64_t first_of_border = s.count * s.width;
  const std::int64_t n = s.rows();
  std::vector<std::vector<double>> a(at(n), std::vector<double>(at(n)));
  for (std::int64_t subject = 0; subject < s.count; ++subject) {
    Indices column;
    for (std::int64_t i = 0; i < s.width; ++i) column.push_back(subject * s.width + i);
    const std::int64_t step = subject < 2 || subject >= 4 ? 1 : 2;
    for (std::int64_t c = 0; c < s.border; c += step) column.push_back(first_of_border + c);
    for (std::int64_t record = 0; record < s.rank; ++record) {
      std::vector<double> z = random.vector(static_cast<std::int64_t>(column.size()));
      if (record < s.width) z[at(record)] += 40.0;  // mostly about that coefficient: no pivot is small
      for (std::size_t i = 0; i < column.size(); ++i)
        for (std::size_t j = 0; j < column.size(); ++j) a[at(column[i])][at(column[j])] += z[i] * z[j];
    }
  }
  for (std::int64_t c = first_of_border; c < n; ++c) a[at(c)][at(c)] += 3.0;
  return problem_of(a);
}

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
  void check(const Problem& problem, Random& random, std::int64_t count, bool definite,
             const Indices* order = nullptr) {
    if (problem.n == 0) return;
    SmMatrix* m = new_sparse(session(), problem);
    if (order) {
      ASSERT_EQ(qxsmorder(m, order->data()), SM_OK);
    }
    ASSERT_EQ(fn().qxsmfact(m, 0), SM_OK);
    rank_ = m->rank;
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
  void check_one_by_one(const Problem& problem, const std::vector<double>& b) {
    SmMatrix* m = new_sparse(session(), problem);
    ASSERT_EQ(fn().qxsmfact(m, 0), SM_OK);
    const std::vector<double> x = solve(m, b);
    for (auto from = b.begin(); from != b.end(); from += problem.n) {
      const std::vector<double> alone = solve(m, {from, from + problem.n});
      const auto together = x.begin() + (from - b.begin());
      EXPECT_TRUE(near(alone, {together, together + problem.n}, 1e-12)) << "vector " << (from - b.begin()) / problem.n;
    }
    ASSERT_EQ(fn().qxsmDestroyMatrix(instance(), &m), SM_OK);
  }
  // The same for subjects in natural order, or in another that has the border last.
  void check_subjects(Random& random, const Subjects& subjects, std::int64_t count) {
    check_subjects(random, subjects, count, natural_order(subjects.rows()));
  }
  void check_subjects(Random& random, const Subjects& subjects, std::int64_t count, const Indices& order) {
    const Problem problem = normal_equations(random, subjects);
    check(problem, random, count, subjects.rank >= subjects.width, &order);
    const std::int64_t dropped = std::max<std::int64_t>(0, subjects.width - subjects.rank);
    EXPECT_EQ(rank_, problem.n - dropped * subjects.count);
  }
  std::int64_t rank_ = 0;  // of the matrix checked last
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

TEST_P(SubstitutionTest, solves_narrow_blocks_with_tails_of_every_length) {
  Random random(5);
  for (std::int64_t width = 1; width <= 10; ++width) {
    for (std::int64_t border = 0; border <= 35; ++border) {
      SCOPED_TRACE(std::to_string(width) + " rows, " + std::to_string(border) + " columns behind them");
      check_subjects(random, {width, border, width}, 1);
    }
  }
}

TEST_P(SubstitutionTest, solves_narrow_blocks_with_dropped_pivots) {
  Random random(7);
  for (std::int64_t width = 2; width <= 9; ++width) {
    for (const std::int64_t border : {0, 1, 7, 8, 10, 17, 32, 33}) {
      SCOPED_TRACE(std::to_string(width) + " rows, " + std::to_string(border) + " columns behind them");
      check_subjects(random, {width, border, 1 + random.below(width - 1)}, 10);
    }
  }
}

TEST_P(SubstitutionTest, solves_1_to_33_right_hand_sides) {
  Random random(9);
  for (std::int64_t count = 1; count <= 33; ++count) check_subjects(random, {6, 10, 6}, count);
}

// Rows of many blocks and of few behind them, in orders in which they stand behind each other in the vectors, upward,
// downward, or for some rows only.
TEST_P(SubstitutionTest, solves_for_many_small_blocks_with_few_rows_behind_them) {
  Random random(15);
  for (const Subjects& subjects :
       {Subjects{1, 3, 1, 80}, Subjects{3, 2, 3, 29}, Subjects{3, 0, 3, 7}, Subjects{6, 6, 6, 20},
        Subjects{7, 5, 7, 15}, Subjects{8, 4, 8, 10}, Subjects{9, 4, 9, 10}, Subjects{20, 2, 20, 4}}) {
    const std::int64_t first_of_border = subjects.count * subjects.width;
    const Indices natural = natural_order(subjects.rows());
    Indices reversed = natural;
    std::reverse(reversed.begin(), reversed.begin() + first_of_border);
    Indices some = natural;
    std::reverse(some.begin() + first_of_border / 3, some.begin() + first_of_border / 2);
    Indices shuffled = natural;
    for (std::int64_t i = first_of_border - 1; i > 0; --i)
      std::swap(shuffled[at(i)], shuffled[at(random.below(i + 1))]);
    for (const std::int64_t count : {8, 24, 33}) {
      SCOPED_TRACE(std::to_string(subjects.width) + " rows, " + std::to_string(subjects.border) +
                   " columns behind them, " + std::to_string(count) + " vectors");
      for (const Indices& order : {natural, reversed, some, shuffled}) check_subjects(random, subjects, count, order);
    }
  }
  check_subjects(random, {6, 5, 4, 20}, 33);  // two dropped pivots each
}

// Of every length that may be left over when rows are cut into chunks for 8 or 16 vectors, and into eights within them.
TEST_P(SubstitutionTest, solves_together_what_it_solves_one_by_one) {
  Random random(11);
  for (const std::int64_t n : {1, 5, 15, 16, 17, 63, 64, 65, 127, 128, 129, 143, 144, 151}) {
    const Problem problem = positive_definite(random_graph(random, n, 4), random);
    for (const std::int64_t count : {7, 8, 9, 15, 16, 17, 24, 31, 32, 33, 40}) {
      SCOPED_TRACE(std::to_string(n) + " rows, " + std::to_string(count) + " vectors");
      check(problem, random, count, true);
      check_one_by_one(problem, random.vector(n * count));
    }
  }
  for (const std::int64_t count : {8, 17, 32}) {
    const Subjects subjects{6, 6, 6, 20};
    check_one_by_one(normal_equations(random, subjects), random.vector(subjects.rows() * count));
  }
}

// Lanes begin where a cache line does, which may be in the last elements of a vector that is at work.
TEST_P(SubstitutionTest, solves_into_an_array_that_begins_anywhere_in_a_cache_line) {
  Random random(13);
  for (const std::int64_t n : {1, 7, 15, 16, 17, 23, 24, 31, 50}) {
    SmMatrix* m = new_sparse(session(), positive_definite(random_graph(random, n, 6), random));
    ASSERT_EQ(fn().qxsmfact(m, 0), SM_OK);
    for (const std::int64_t count : {16, 17, 24, 31, 32, 39, 40, 47, 48}) {
      const std::vector<double> b = random.vector(n * count);
      std::vector<double> want;
      for (auto from = b.begin(); from != b.end(); from += n) {
        const std::vector<double> alone = solve(m, {from, from + n});
        want.insert(want.end(), alone.begin(), alone.end());
      }
      for (const TileSet set : kSets) {
        if (!use_tiles(set)) continue;
        for (std::size_t offset = 0; offset < 8; ++offset) {
          std::vector<double> room(b.size() + 16, -7.5);
          double* x = room.data() + offset;
          ASSERT_EQ(fn().qxsmsubst(m, b.data(), x, static_cast<std::int32_t>(count)), SM_OK);
          EXPECT_TRUE(near({x, x + b.size()}, want, 1e-12)) << n << " rows, " << count << " vectors at " << offset;
          EXPECT_EQ(std::count(room.begin(), room.begin() + static_cast<std::ptrdiff_t>(offset), -7.5),
                    static_cast<std::ptrdiff_t>(offset));
          EXPECT_EQ(std::count(x + b.size(), room.data() + room.size(), -7.5),
                    static_cast<std::ptrdiff_t>(16 - offset));
        }
      }
    }
    ASSERT_EQ(fn().qxsmDestroyMatrix(instance(), &m), SM_OK);
  }
}

}  // namespace
}  // namespace sm::test
