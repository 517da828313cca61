// The inverse on the pattern of the factor, held to solves with unit vectors and to the column method, with each set of
// tile kernels that the CPU has.
#include "cholesky/selected_inverse.hpp"

#include <algorithm>
#include <cmath>

#include "cholesky/block_cases.hpp"
#include "cholesky/inverse_work.hpp"
#include "cholesky/search.hpp"
#include "cholesky/steps.hpp"
#include "cholesky/tiles.hpp"

namespace sm::test {
namespace {

constexpr TileSet kSets[] = {TileSet::avx512, TileSet::avx2, TileSet::portable};

class SelectedInverseTest : public ModuleTest {
 protected:
  void TearDown() override {
    if (!use_tiles(TileSet::avx512) && !use_tiles(TileSet::avx2)) use_tiles(TileSet::portable);
    ModuleTest::TearDown();
  }
  SmMatrix* factored(const Problem& problem, bool natural) {
    SmMatrix* m = new_sparse(session(), problem);
    EXPECT_EQ(natural ? qxsmorder(m, natural_order(problem.n).data()) : qxsmmd(m), SM_OK);
    EXPECT_EQ(fn().qxsmfact(m, 0), SM_OK);
    return m;
  }
  // Every element of U's pattern, and only those, beside A^- from solves.
  static void expect_inverse(SmMatrix* m, const Dense& want, double tolerance) {
    SelectedInverse diagonal(*m);
    ASSERT_EQ(diagonal.compute(SelectedInverse::Wanted::diagonal), SM_OK);
    SelectedInverse z(*m);
    ASSERT_EQ(z.compute(), SM_OK);
    const double bound = tolerance * static_cast<double>(largest(want));
    const std::vector<Indices> rows = stored_structure(m);
    for (std::int64_t k = 0; k < m->rows; ++k) {
      const std::int64_t i = m->perm[k];
      ASSERT_NEAR(z.diagonal(k), static_cast<double>(want(i, i)), bound) << "row " << k;
      ASSERT_EQ(diagonal.diagonal(k), z.diagonal(k));
      ASSERT_EQ(z.at(SelectedInverse::place(*m, i, i)), z.diagonal(k));
      for (const std::int64_t c : rows[at(k)]) {
        const std::int64_t place = SelectedInverse::place(*m, m->perm[c], i);
        ASSERT_NE(place, SelectedInverse::kNowhere);
        ASSERT_EQ(SelectedInverse::place(*m, i, m->perm[c]), place);
        ASSERT_NEAR(z.at(place), static_cast<double>(want(i, m->perm[c])), bound) << "row " << k << " column " << c;
      }
    }
  }
  // Answers the rank.
  std::int64_t check(const Problem& problem, bool natural, double tolerance = 1e-11) {
    SmMatrix* m = factored(problem, natural);
    const std::int64_t rank = m->rank;
    const Dense want = solved_identity(m);
    for (const TileSet set : kSets) {
      if (!use_tiles(set)) continue;
      SCOPED_TRACE(tile_kernels().name);
      expect_inverse(m, want, tolerance);
    }
    std::vector<double> columns(at(m->rows), 0.0);
    diagonal_by_columns(*m, columns.data());
    const double bound = tolerance * static_cast<double>(largest(want));
    for (std::int64_t i = 0; i < m->rows; ++i) EXPECT_NEAR(columns[at(i)], static_cast<double>(want(i, i)), bound) << i;
    EXPECT_EQ(fn().qxsmDestroyMatrix(instance(), &m), SM_OK);
    return rank;
  }
};
INSTANTIATE_BOTH_HOSTS(SelectedInverseTest);

TEST_P(SelectedInverseTest, agrees_with_solves_on_small_matrices_of_every_structure) {
  for (std::uint64_t seed = 0; seed < 800; ++seed) {
    Random random(seed);
    const Problem problem = positive_definite(any_graph(random, 50), random);
    if (problem.n == 0) continue;
    EXPECT_EQ(check(problem, random.chance(50)), problem.n);
    if (HasFailure()) FAIL() << "seed " << seed;
  }
}

TEST_P(SelectedInverseTest, agrees_with_solves_on_all_structures_of_up_to_three_rows) {
  Random random(1);
  for (const Graph& g : smallest_graphs()) check(positive_definite(g, random), true);
}

TEST_P(SelectedInverseTest, agrees_with_solves_on_linked_cliques) {
  for (std::uint64_t seed = 0; seed < 60; ++seed) {
    Random random(seed);
    const Graph g = any_linked_cliques(random);
    check(positive_definite(g, random), random.chance(70));
    if (HasFailure()) FAIL() << "seed " << seed;
  }
}

TEST_P(SelectedInverseTest, agrees_with_solves_at_the_edges_of_strips_and_tiles) {
  Random random(2);
  for (const std::int64_t width : {1, 2, 3, 4, 5, 7, 8, 9, 12, 15, 16, 17, 24, 25, 33})
    for (const std::int64_t tail : {0, 1, 3, 4, 5, 8, 9, 11, 12, 13, 23, 24, 25})
      check(positive_definite(bordered_clique(width, width % 3 == 0 ? 2 : 0, tail), random), true);
}

TEST_P(SelectedInverseTest, agrees_with_solves_on_blocks_larger_than_every_front_and_panel) {
  Random random(3);
  for (const std::int64_t n : Indices{127, 129, 256, kMostFrontOrder - 1, kMostFrontOrder, kMostFrontOrder + 1, 450})
    check(positive_definite(clique(n), random), true);
  for (const std::int64_t n : {1, 9, 120, 128, 140}) {
    check(positive_definite(bordered_clique(n, 2, kMostFrontOrder + 3), random), true);
    check(positive_definite(linked_cliques(random, {n, 5, 300, 1, 130}, 95), random), true);
  }
}

TEST_P(SelectedInverseTest, agrees_with_solves_on_grids_trees_and_hubs) {
  Random random(4);
  check(positive_definite(grid(19, 23), random), false);
  check(positive_definite(grid(16, 16), random), true);
  check(positive_definite(random_tree(random, 300), random), false);
  check(positive_definite(random_tree(random, 200), random), true);
  check(positive_definite(star(300, 0), random), false);
  check(positive_definite(arrowhead(400, 3), random), false);
  check(positive_definite(arrowhead(200, 60), random), true);
  check(positive_definite(multiplied(random, grid(9, 9)), random), false);
  check(positive_definite(elements(random, 200, 60, 12), random), false);
}

TEST_P(SelectedInverseTest, agrees_with_solves_on_subjects_with_one_border) {
  Random random(5);
  for (std::int64_t width = 1; width <= 10; ++width)
    for (const std::int64_t border : {0, 1, 2, 3, 4, 5, 7, 8, 9, 12, 15, 16, 17, 23, 24, 25, 33}) {
      check(positive_definite(subjects(whole_tails(3, border), width, border), random), true);
      if (HasFailure()) FAIL() << "width " << width << " border " << border;
    }
}

TEST_P(SelectedInverseTest, agrees_with_solves_on_subjects_with_parts_of_a_border) {
  for (std::uint64_t seed = 0; seed < 80; ++seed) {
    Random random(seed);
    check(positive_definite(mixed_subjects(random, 7, 30), random), random.chance(70));
    if (HasFailure()) FAIL() << "seed " << seed;
  }
}

TEST_P(SelectedInverseTest, leaves_zeros_for_pivots_that_were_dropped_in_small_blocks) {
  Random random(6);
  for (std::int64_t width = 2; width <= 9; ++width)
    for (const std::int64_t border : {0, 1, 4, 7, 10, 16, 24, 25}) {
      const Twins twins = twin_subjects(random, 3, width, border);
      EXPECT_EQ(check(twins.problem, true, 1e-9), twins.rank);
      if (HasFailure()) FAIL() << "width " << width << " border " << border;
    }
}

TEST(FindColumnAtEnds, answers_as_a_search_from_the_front) {
  for (std::uint64_t seed = 0; seed < 200; ++seed) {
    Random random(seed);
    Indices list;
    for (std::int64_t c = 0; c < 40; ++c)
      if (random.chance(20 + static_cast<std::int64_t>(seed) % 81)) list.push_back(c);
    const auto length = static_cast<std::int64_t>(list.size());
    for (std::int64_t c = -2; c < 43; ++c) {
      ASSERT_EQ(find_column_at_ends(list.data(), length, c), std::find(list.begin(), list.end(), c) - list.begin());
    }
  }
}

// Row i touches the `width` rows behind it: every tail is that of the row above but for one column at either end. Some
// edges are missing, and some rows are touched by others that come before all.
Graph chain(Random& random, std::int64_t n, std::int64_t width, std::int64_t percent) {
  const std::int64_t before = n / 8;
  Graph g{before + n, {}};
  for (std::int64_t i = 0; i < before; ++i) {
    const std::int64_t touched = before + random.below(n);
    for (std::int64_t j = touched; j < std::min(touched + 1 + random.below(6), g.n); ++j) g.edges.emplace_back(i, j);
  }
  for (std::int64_t i = before; i < g.n; ++i)
    for (std::int64_t j = i + 1; j <= std::min(i + width, g.n - 1); ++j)
      if (j == i + 1 || random.chance(percent)) g.edges.emplace_back(i, j);
  return g;
}

// Every row one to three times: the rank is that of the problem.
Problem repeated(const Problem& problem, Random& random) {
  std::vector<Indices> copies(at(problem.n));
  Problem result{"repeated", 0, {}};
  for (Indices& list : copies)
    for (std::int64_t c = random.chance(60) ? 1 : 1 + random.below(3); c > 0; --c) list.push_back(result.n++);
  for (const Entry& e : problem.upper)
    for (const std::int64_t i : copies[at(e.row)])
      for (const std::int64_t j : copies[at(e.col)])
        if (i <= j) result.upper.push_back({i, j, e.value});
  std::sort(result.upper.begin(), result.upper.end(),
            [](const Entry& a, const Entry& b) { return std::pair(a.row, a.col) < std::pair(b.row, b.col); });
  return result;
}

TEST_P(SelectedInverseTest, agrees_with_solves_where_tails_are_nearly_those_of_their_parents) {
  for (std::uint64_t seed = 0; seed < 60; ++seed) {
    Random random(seed);
    const Graph g =
        growing_tails(random, 5 + random.below(60), 1 + random.below(seed % 3 == 0 ? 6 : 1), 10 + random.below(50));
    check(positive_definite(g, random), random.chance(70));
    if (HasFailure()) FAIL() << "seed " << seed;
  }
}

// A front has room for a quarter of its order: chains are longer than that, and end in fronts of every size.
TEST_P(SelectedInverseTest, agrees_with_solves_on_chains_longer_than_the_room_of_a_front) {
  Random random(8);
  for (const std::int64_t width : {1, 2, 7, 8, 9, 24, 60})
    for (const std::int64_t percent : {100, 60, 10}) {
      check(positive_definite(chain(random, 150, width, percent), random), true);
      if (HasFailure()) FAIL() << "width " << width << " percent " << percent;
    }
  check(positive_definite(chain(random, 620, kMostFrontOrder - 2, 100), random), true);
  check(positive_definite(chain(random, 620, kMostFrontOrder + 20, 100), random), true);
}

// Of the two rows that hang on a row of the chain the other one comes last: every front is still needed below.
TEST_P(SelectedInverseTest, agrees_with_solves_below_more_fronts_than_are_kept) {
  Random random(9);
  constexpr std::int64_t kLevels = 540;
  Graph g{2 * kLevels, {}};
  for (std::int64_t i = 0; i + 2 < g.n; ++i) {
    if (i % 2 == 1) g.edges.emplace_back(i, i + 1);
    for (std::int64_t j = i + 2; i % 2 == 0 && j <= std::min(i + 6, g.n - 2); j += 2) g.edges.emplace_back(i, j);
  }
  check(positive_definite(g, random), true);
}

TEST_P(SelectedInverseTest, leaves_zeros_for_pivots_that_were_dropped_in_shared_fronts) {
  for (std::uint64_t seed = 0; seed < 40; ++seed) {
    Random random(seed);
    const Graph g = seed % 2 == 0
                        ? chain(random, 20 + random.below(60), 1 + random.below(30), 30 + random.below(71))
                        : growing_tails(random, 5 + random.below(40), 1 + random.below(4), 10 + random.below(30));
    const Problem problem = positive_definite(g, random);
    EXPECT_EQ(check(repeated(problem, random), true, 1e-9), problem.n);
    if (HasFailure()) FAIL() << "seed " << seed;
  }
}

TEST_P(SelectedInverseTest, leaves_zeros_where_pivots_were_dropped) {
  for (std::uint64_t seed = 0; seed < 150; ++seed) {
    Random random(seed);
    const Semidefinite s = cross_product(random, 1 + random.below(50), random.below(20), random.below(8));
    EXPECT_EQ(check(s.problem, random.chance(50), 1e-9), s.rank);
    if (HasFailure()) FAIL() << "seed " << seed;
  }
}

TEST_P(SelectedInverseTest, serves_crossed_effects_of_which_all_levels_are_kept) {
  for (std::uint64_t seed = 0; seed < 30; ++seed) {
    Random random(seed);
    const Problem problem = crossed_counts(random, 2 + random.below(60), 2 + random.below(60));
    EXPECT_EQ(check(problem, random.chance(30), 1e-9), problem.n - 2);
    if (HasFailure()) FAIL() << "seed " << seed;
  }
}

}  // namespace
}  // namespace sm::test
