// The blocked numeric factorization held to the row-at-a-time one, with each set of tile kernels that the CPU has.
#include <cmath>

#include "cholesky/block_cases.hpp"
#include "cholesky/block_work.hpp"
#include "cholesky/cholesky_support.hpp"
#include "cholesky/shared_tails.hpp"

namespace sm::test {
namespace {

constexpr TileSet kSets[] = {TileSet::avx512, TileSet::avx2, TileSet::portable};

// What a factorization left, or where it gave up.
struct Outcome {
  SmStatus status = SM_OK;
  std::int64_t rank = 0;
  double log_det = 0.0;
  std::vector<double> u;
  std::vector<double> reciprocals;
};

using Road = SmStatus (*)(const NumericArrays&, Pivots&);

Outcome outcome_of(SmMatrix* m, Road road) {
  const std::int64_t n = m->rows;
  const NumericArrays arrays(*m, 3 * n + 2 + m->factor_iju[n - 1]);
  Pivots pivots(*m, m->instance->tolerances[2]);
  Outcome out;
  out.status = road(arrays, pivots);
  out.rank = pivots.rank();
  out.log_det = pivots.log_sum();
  out.u = doubles(arrays.values, m->factor_iu[n]);
  out.reciprocals = doubles(arrays.diag, n);
  return out;
}

void expect_same(const Outcome& got, const Outcome& want) {
  ASSERT_EQ(got.status, want.status);
  EXPECT_EQ(got.rank, want.rank);  // for 103 too: the accepted pivots before the bad one
  EXPECT_NEAR(got.log_det, want.log_det, 1e-10 * (1.0 + std::fabs(want.log_det)));
  if (want.status != SM_OK) return;
  EXPECT_TRUE(near(got.u, want.u, 1e-10));
  for (std::size_t k = 0; k < want.reciprocals.size(); ++k) {
    ASSERT_EQ(got.reciprocals[k] == 0.0, want.reciprocals[k] == 0.0) << "pivot " << k;
    ASSERT_NEAR(got.reciprocals[k], want.reciprocals[k], 1e-9 * std::fabs(want.reciprocals[k])) << "pivot " << k;
  }
}

class BlockedTest : public ModuleTest {
 protected:
  void TearDown() override {
    if (!use_tiles(TileSet::avx512) && !use_tiles(TileSet::avx2)) use_tiles(TileSet::portable);
    ModuleTest::TearDown();
  }
  // State 4, in natural order or as the module orders it.
  SmMatrix* symbolic(const Problem& problem, bool natural) {
    SmMatrix* m = new_sparse(session(), problem);
    EXPECT_EQ(qxsmmd(m), SM_OK);
    if (natural) impose_order(m, natural_order(problem.n));
    EXPECT_EQ(bring_to_symbolic(m), SM_OK);
    return m;
  }
  // Both roads on the problem; answers what the plain one found.
  Outcome compare(const Problem& problem, bool natural) {
    SmMatrix* m = symbolic(problem, natural);
    const Outcome want = outcome_of(m, factor_by_rows);
    for (const TileSet set : kSets) {
      if (!use_tiles(set)) continue;
      SCOPED_TRACE(tile_kernels().name);
      expect_same(outcome_of(m, factor_in_blocks), want);
    }
    EXPECT_EQ(fn().qxsmDestroyMatrix(instance(), &m), SM_OK);
    return want;
  }

 private:
  static SmStatus bring_to_symbolic(SmMatrix* m) {
    const SmStatus status = qxsmreorder(m);
    return status == SM_OK ? qxsmsymbfact(m) : status;
  }
};
INSTANTIATE_BOTH_HOSTS(BlockedTest);

TEST_P(BlockedTest, agrees_with_the_rows_on_small_matrices_of_every_structure) {
  for (std::uint64_t seed = 0; seed < 1500; ++seed) {
    Random random(seed);
    const Problem problem = positive_definite(any_graph(random, 60), random);
    if (problem.n == 0) continue;
    EXPECT_EQ(compare(problem, random.chance(50)).rank, problem.n);
    if (HasFailure()) FAIL() << "seed " << seed;
  }
}

TEST_P(BlockedTest, agrees_with_the_rows_on_all_structures_of_up_to_three_rows) {
  Random random(1);
  for (const Graph& g : smallest_graphs()) compare(positive_definite(g, random), true);
}

TEST_P(BlockedTest, agrees_with_the_rows_on_linked_cliques) {
  for (std::uint64_t seed = 0; seed < 250; ++seed) {
    Random random(seed);
    const Graph g = any_linked_cliques(random);
    compare(positive_definite(g, random), random.chance(70));
    if (HasFailure()) FAIL() << "seed " << seed;
  }
}

TEST_P(BlockedTest, agrees_with_the_rows_at_the_edges_of_strips_tiles_and_panels) {
  Random random(2);
  for (const std::int64_t width : {1, 2, 3, 4, 5, 7, 8, 9, 12, 13, 16, 17, 18, 25})
    for (const std::int64_t tail : {0, 1, 3, 4, 5, 7, 8, 9, 12, 13, 23, 24, 25, 49})
      compare(positive_definite(bordered_clique(width, width % 3 == 0 ? 2 : 0, tail), random), true);
  for (const std::int64_t width : {1, 2, 17, 40})
    for (const std::int64_t tail : {239, 240, 241, 256, 257}) {
      compare(positive_definite(bordered_clique(width, 0, tail), random), true);
      compare(positive_definite(bordered_clique(width, 3, tail), random), true);
    }
}

TEST_P(BlockedTest, agrees_with_the_rows_on_cliques_wider_than_every_panel) {
  Random random(3);
  for (const std::int64_t n : {127, 128, 129, 136, 255, 256, 257, 300, 420}) {
    compare(positive_definite(clique(n), random), true);
    Indices sizes{n, 5, 150, 1, 30};
    compare(positive_definite(linked_cliques(random, sizes, 90), random), true);
  }
}

TEST_P(BlockedTest, agrees_with_the_rows_on_grids_and_hubs) {
  Random random(4);
  compare(positive_definite(grid(37, 41), random), false);
  compare(positive_definite(grid(20, 20), random), true);
  compare(positive_definite(arrowhead(600, 3), random), false);
  compare(positive_definite(arrowhead(200, 60), random), true);
  compare(positive_definite(multiplied(random, grid(12, 12)), random), false);
  compare(positive_definite(elements(random, 300, 90, 12), random), false);
}

TEST_P(BlockedTest, agrees_with_the_rows_where_blocks_follow_others_with_most_of_their_columns) {
  for (std::uint64_t seed = 0; seed < 120; ++seed) {
    Random random(seed);
    const std::int64_t border = 30 + random.below(seed % 10 == 0 ? 500 : 120);
    const Graph g = growing_tails(random, 5 + random.below(50), 1 + random.below(seed % 3 == 0 ? 6 : 1), border);
    compare(positive_definite(g, random), random.chance(80));
    if (HasFailure()) FAIL() << "seed " << seed;
  }
}

// Row 0 has most of what row 1 has and would follow it: what it lacks, column 2, must not be reached by its infinity.
TEST_P(BlockedTest, ends_as_the_rows_do_where_an_entry_is_infinite) {
  constexpr std::int64_t n = 43;
  Graph graph{n, {}};
  for (std::int64_t j = 1; j < n - 1; ++j) {
    if (j != 2) graph.edges.emplace_back(0, j);
    if (j > 1) graph.edges.emplace_back(1, j);
  }
  for (std::int64_t i = 2; i < n; ++i) {
    for (std::int64_t j = i + 1; j < n; ++j) graph.edges.emplace_back(i, j);
  }
  int ended_early = 0;
  for (const double entry : {HUGE_VAL, -HUGE_VAL, 1e308}) {
    for (std::int64_t column = 3; column < n - 1; ++column) {
      Random random(static_cast<std::uint64_t>(column));
      Problem problem = positive_definite(graph, random);
      for (auto& e : problem.upper) {
        if (e.row == 0 && e.col == column) e.value = entry;
      }
      SmMatrix* m = symbolic(problem, true);
      const Outcome want = outcome_of(m, factor_by_rows);
      for (const TileSet set : kSets) {
        if (!use_tiles(set)) continue;
        const Outcome got = outcome_of(m, factor_in_blocks);
        EXPECT_EQ(got.status, want.status) << tile_kernels().name << ", " << entry << " in column " << column;
        EXPECT_EQ(got.rank, want.rank) << tile_kernels().name << ", " << entry << " in column " << column;
      }
      ended_early += want.status == SM_NOT_DEFINITE;
      fn().qxsmDestroyMatrix(instance(), &m);
    }
  }
  EXPECT_GT(ended_early, 0);
}

TEST_P(BlockedTest, drops_what_the_rows_drop) {
  for (std::uint64_t seed = 0; seed < 300; ++seed) {
    Random random(seed);
    const Semidefinite s = cross_product(random, 1 + random.below(60), random.below(20), random.below(8));
    EXPECT_EQ(compare(s.problem, random.chance(50)).rank, s.rank);
    if (HasFailure()) FAIL() << "seed " << seed;
  }
}

TEST_P(BlockedTest, drops_a_level_of_each_factor_when_all_are_kept) {
  for (std::uint64_t seed = 0; seed < 60; ++seed) {
    Random random(seed);
    const Problem problem = crossed_counts(random, 2 + random.below(60), 2 + random.below(60));
    EXPECT_EQ(compare(problem, random.chance(30)).rank, problem.n - 2);
    if (HasFailure()) FAIL() << "seed " << seed;
  }
}

TEST_P(BlockedTest, drops_pivots_anywhere_in_a_wide_block) {
  // A clique of columns of which some are copies of the one before: their pivots are exactly 0.
  Random random(5);
  for (const std::int64_t n : {9, 24, 40, 140}) {
    const std::int64_t tail = 30;
    std::vector<std::vector<double>> x(at(n + tail), std::vector<double>(at(n + tail), 0.0));
    std::vector<std::int64_t> kind(at(n), 0);  // which unit vector a column holds besides the common part
    for (std::int64_t i = 1; i < n; ++i) kind[at(i)] = kind[at(i - 1)] + (random.chance(30) ? 0 : 1);
    for (std::int64_t i = 0; i < n; ++i)
      for (std::int64_t j = 0; j < n; ++j) x[at(i)][at(j)] = 1.0 + (kind[at(i)] == kind[at(j)] ? 4.0 : 0.0);
    for (std::int64_t i = 0; i < n; ++i)
      for (std::int64_t j = n; j < n + tail; ++j)
        x[at(i)][at(j)] = x[at(j)][at(i)] = 0.125 * static_cast<double>(j - n + 1);
    for (std::int64_t j = n; j < n + tail; ++j) x[at(j)][at(j)] = 64.0 * static_cast<double>(n);
    EXPECT_EQ(compare(problem_of(x), true).rank, kind.back() + 1 + tail);
  }
}

TEST_P(BlockedTest, agrees_with_the_rows_on_subjects_with_one_border) {
  Random random(8);
  for (std::int64_t width = 1; width <= 10; ++width)
    for (std::int64_t border = 0; border <= 33; border += border < 18 ? 1 : 3)
      for (const std::int64_t count : {1, 2, 3, 7}) {
        compare(positive_definite(subjects(whole_tails(count, border), width, border), random), true);
        if (HasFailure()) FAIL() << count << " subjects of " << width << " with a border of " << border;
      }
}

TEST_P(BlockedTest, agrees_with_the_rows_on_subjects_with_parts_of_a_border) {
  for (std::uint64_t seed = 0; seed < 400; ++seed) {
    Random random(seed);
    compare(positive_definite(mixed_subjects(random, 12, 40), random), random.chance(70));
    if (HasFailure()) FAIL() << "seed " << seed;
  }
}

TEST_P(BlockedTest, agrees_with_the_rows_on_a_clique_of_many_rows_beside_others_with_its_tail) {
  Random random(9);
  for (const std::int64_t width : {9, 17, 64, 129, 140})
    for (const std::int64_t border : {1, 8, 10, 16}) {
      compare(positive_definite(subjects(whole_tails(3, border), width, border), random), true);
    }
}

TEST_P(BlockedTest, drops_pivots_anywhere_in_small_blocks) {
  Random random(10);
  for (std::int64_t width = 2; width <= 9; ++width)
    for (std::int64_t border = 0; border <= 25; border += border < 18 ? 1 : 7) {
      const Twins twins = twin_subjects(random, 4, width, border);
      EXPECT_EQ(compare(twins.problem, true).rank, twins.rank);
      if (HasFailure()) FAIL() << "width " << width << " border " << border;
    }
}

TEST_P(BlockedTest, gives_up_in_a_small_block_where_the_rows_do) {
  for (std::uint64_t seed = 0; seed < 200; ++seed) {
    Random random(seed);
    const std::int64_t border = random.below(20);
    const std::vector<Indices> tails = mixed_tails(random, 6, border);
    Problem problem = positive_definite(subjects(tails, 2 + random.below(7), border), random);
    const std::int64_t bad = random.below(problem.n);
    for (Entry& e : problem.upper)
      if (e.row == bad && e.col == bad) e.value = -e.value;
    EXPECT_EQ(compare(problem, true).status, SM_NOT_DEFINITE);
    if (HasFailure()) FAIL() << "seed " << seed;
  }
}

TEST_P(BlockedTest, the_log_determinant_holds_pivots_of_any_size) {
  for (std::uint64_t seed = 0; seed < 40; ++seed) {
    Random random(seed);
    Problem problem = positive_definite(random.chance(50) ? grid(7, 8) : any_linked_cliques(random), random);
    Indices exponent;
    const std::int64_t most = seed % 2 == 0 ? 255 : 40;
    for (std::int64_t k = 0; k < problem.n; ++k) exponent.push_back(random.below(2 * most + 1) - most);
    for (Entry& e : problem.upper) {
      e.value = std::ldexp(e.value, static_cast<int>(exponent[at(e.row)] + exponent[at(e.col)]));
    }
    const Outcome got = compare(problem, true);
    ASSERT_EQ(got.rank, problem.n);
    long double want = 0.0L;
    for (const double reciprocal : got.reciprocals) want -= std::log(static_cast<long double>(reciprocal));
    EXPECT_NEAR(got.log_det, static_cast<double>(want), 1e-11 * (1.0 + std::fabs(static_cast<double>(want)))) << seed;
  }
}

TEST_P(BlockedTest, gives_up_at_the_row_where_the_rows_do) {
  int refused = 0;
  for (std::uint64_t seed = 0; seed < 600; ++seed) {
    Random random(seed);
    Graph g = random.chance(50) ? any_graph(random, 50) : linked_cliques(random, {20, 3, 30, 9, 1, 12}, 60);
    if (g.n == 0) continue;
    Problem problem = positive_definite(g, random);
    const std::int64_t bad = random.below(problem.n);
    for (Entry& e : problem.upper)
      if (e.row == bad && e.col == bad) e.value = -e.value;
    const Outcome want = compare(problem, random.chance(50));
    EXPECT_EQ(want.status, SM_NOT_DEFINITE);
    refused += want.status == SM_NOT_DEFINITE;
    if (HasFailure()) FAIL() << "seed " << seed;
  }
  EXPECT_GT(refused, 500);
}

TEST_P(BlockedTest, can_be_done_again_from_what_it_left) {
  Random random(6);
  const Problem problem = positive_definite(linked_cliques(random, {9, 30, 1, 2, 140, 8}, 70), random);
  SmMatrix* m = symbolic(problem, true);
  ASSERT_EQ(qxsmnumfact(m), SM_OK);
  const std::vector<std::uint64_t> u = bits(m->factor_values, m->factor_iu[problem.n]);
  const std::vector<std::uint64_t> d = bits(m->factor_diag, problem.n);
  std::vector<double> b(at(problem.n), 1.0);
  std::vector<double> x(at(problem.n));
  ASSERT_EQ(qxsmsubst(m, b.data(), x.data(), 1), SM_OK);  // writes the scratch
  m->state = SM_STATE_SYMBOLIC;
  ASSERT_EQ(qxsmnumfact(m), SM_OK);
  EXPECT_EQ(bits(m->factor_values, m->factor_iu[problem.n]), u);
  EXPECT_EQ(bits(m->factor_diag, problem.n), d);
}

TEST_P(BlockedTest, its_work_memory_fits_the_stack_of_a_host) {
  EXPECT_LE(sizeof(Panels) + sizeof(SharedTails), 448U * 1024U);
}

TEST_P(BlockedTest, the_public_operations_take_either_road_to_the_same_record) {
  Random random(7);
  SmMatrix* m = symbolic(positive_definite(grid(9, 9), random), false);
  ASSERT_EQ(factor_numeric_by_rows(*m), SM_OK);
  EXPECT_EQ(m->state, SM_STATE_FACTORED);
  const double log_det = m->log_det;
  const std::vector<double> u = doubles(m->factor_values, m->factor_iu[m->rows]);
  m->state = SM_STATE_SYMBOLIC;
  ASSERT_EQ(qxsmnumfact(m), SM_OK);
  EXPECT_EQ(m->rank, m->rows);
  EXPECT_NEAR(m->log_det, log_det, 1e-10);
  EXPECT_TRUE(near(doubles(m->factor_values, m->factor_iu[m->rows]), u, 1e-12));
}

}  // namespace
}  // namespace sm::test
