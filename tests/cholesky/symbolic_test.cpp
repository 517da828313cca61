#include <algorithm>

#include "cholesky/cholesky_support.hpp"
#include "cholesky/structure_reference.hpp"

namespace sm::test {
namespace {

class SymbolicTest : public ModuleTest {
 protected:
  // Reordered (state 3) by minimum degree, or by the given order.
  SmMatrix* reordered_matrix(const Graph& graph, const Indices* order = nullptr) {
    Random random(static_cast<std::uint64_t>(graph.n));
    SmMatrix* m = new_sparse(session(), positive_definite(graph, random));
    EXPECT_EQ(qxsmmd(m), SM_OK);
    if (order) impose_order(m, *order);
    EXPECT_EQ(qxsmreorder(m), SM_OK);
    return m;
  }
  void destroy(SmMatrix* m) { EXPECT_EQ(fn().qxsmDestroyMatrix(instance(), &m), SM_OK); }
};
INSTANTIATE_BOTH_HOSTS(SymbolicTest);

// What every symbolic factor obeys, besides being the right one.
void expect_well_formed(const SmMatrix* m) {
  const std::int64_t n = m->rows;
  EXPECT_EQ(m->state, SM_STATE_SYMBOLIC);
  EXPECT_EQ(m->factor_iju, m->work);
  EXPECT_EQ(m->factor_iu, m->work + n);
  EXPECT_EQ(m->factor_ju, m->work + 3 * n + 1);
  EXPECT_EQ(m->factor_iu[0], 0);
  const std::int64_t last_used = m->factor_iju[n - 1];
  EXPECT_GE(last_used, -1);
  EXPECT_LE(last_used + 1, m->factor_iu[n]);  // compressed: never more than one subscript for each entry
  std::int64_t highest = -1;
  for (std::int64_t k = 0; k < n; ++k) {
    const std::int64_t length = m->factor_iu[k + 1] - m->factor_iu[k];
    ASSERT_GE(length, 0);
    if (length == 0) continue;
    ASSERT_GE(m->factor_iju[k], 0);
    ASSERT_LE(m->factor_iju[k] + length - 1, last_used);
    highest = std::max(highest, m->factor_iju[k] + length - 1);
  }
  EXPECT_EQ(highest, last_used);
  EXPECT_GE(m->work_capacity, words_needed(m));
}

TEST_P(SymbolicTest, finds_the_true_fill_of_random_structures) {
  for (std::uint64_t seed = 0; seed < 1500; ++seed) {
    Random random(seed);
    const Graph graph = any_graph(random, 46);
    if (graph.n == 0) continue;
    const Indices order = random.permutation(graph.n);
    SmMatrix* m = reordered_matrix(graph, random.chance(50) ? &order : nullptr);
    const StoredRows rows = rows_of(m);
    ASSERT_EQ(qxsmsymbfact(m), SM_OK) << "seed " << seed;
    expect_well_formed(m);
    const Indices perm = words(m->perm, graph.n);
    EXPECT_EQ(stored_structure(m), true_fill(graph, perm)) << "seed " << seed;
    EXPECT_EQ(words(m->factor_ju, m->factor_iju[graph.n - 1] + 1), compressed_subscripts(graph, perm))
        << "seed " << seed;
    EXPECT_TRUE(rows_of(m) == rows);
    destroy(m);
    if (HasFailure()) FAIL() << "seed " << seed;
  }
}

TEST_P(SymbolicTest, finds_the_true_fill_where_long_rows_take_over_from_many) {
  for (std::uint64_t seed = 0; seed < 24; ++seed) {
    Random random(seed);
    const std::int64_t n = 100 + random.below(120);
    const Graph families[] = {elements(random, n, n / 3, 4 + random.below(8)), grid(11, 13),
                              multiplied(random, grid(8, 9)), arrowhead(n, 30), random_graph(random, n, 2)};
    const Graph graph = families[seed % 5];
    const Indices order = random.permutation(graph.n);
    SmMatrix* m = reordered_matrix(graph, random.chance(50) ? &order : nullptr);
    ASSERT_EQ(qxsmsymbfact(m), SM_OK) << "seed " << seed;
    expect_well_formed(m);
    const Indices perm = words(m->perm, graph.n);
    EXPECT_EQ(stored_structure(m), true_fill(graph, perm)) << "seed " << seed;
    EXPECT_EQ(words(m->factor_ju, m->factor_iju[graph.n - 1] + 1), compressed_subscripts(graph, perm))
        << "seed " << seed;
    destroy(m);
    if (HasFailure()) FAIL() << "seed " << seed;
  }
}

// Row 2 joins the even columns with the odd ones: up to and beyond every whole number of words of 64 columns, some of
// the last ones missing or not.
TEST_P(SymbolicTest, finds_a_row_that_joins_two_halves_of_the_columns) {
  for (std::int64_t n = 20; n < 290; n += n % 64 < 8 || n % 64 > 60 ? 1 : 5) {
    for (std::int64_t missing = 0; missing < 3; ++missing) {
      Graph graph{n, {{0, 2}, {1, 2}}};
      for (std::int64_t j = 3; j < n - missing; ++j) graph.edges.emplace_back(j % 2, j);
      const Indices order = natural_order(n);
      SmMatrix* m = reordered_matrix(graph, &order);
      ASSERT_EQ(qxsmsymbfact(m), SM_OK) << n;
      expect_well_formed(m);
      EXPECT_EQ(stored_structure(m), true_fill(graph, order)) << n;
      EXPECT_EQ(words(m->factor_ju, m->factor_iju[n - 1] + 1), compressed_subscripts(graph, order)) << n;
      destroy(m);
      if (HasFailure()) FAIL() << n << " columns, without the last " << missing;
    }
  }
}

TEST_P(SymbolicTest, finds_the_true_fill_of_every_graph_of_up_to_five_vertices) {
  for (std::int64_t n = 1; n <= 5; ++n) {
    const Graph all = clique(n);
    const Indices natural = natural_order(n);
    for (std::uint64_t chosen = 0; chosen < (1U << all.edges.size()); ++chosen) {
      Graph graph{n, {}};
      for (std::size_t e = 0; e < all.edges.size(); ++e)
        if (chosen >> e & 1U) graph.edges.push_back(all.edges[e]);
      SmMatrix* m = reordered_matrix(graph, &natural);
      ASSERT_EQ(qxsmsymbfact(m), SM_OK);
      expect_well_formed(m);
      ASSERT_EQ(stored_structure(m), true_fill(graph, natural)) << n << " vertices, edges " << chosen;
      destroy(m);
    }
  }
}

TEST_P(SymbolicTest, a_matrix_without_edges_has_an_empty_factor) {
  SmMatrix* m = reordered_matrix(empty_graph(4));
  ASSERT_EQ(qxsmsymbfact(m), SM_OK);
  EXPECT_EQ(words(m->factor_iu, 5), (Indices{0, 0, 0, 0, 0}));
  EXPECT_EQ(m->factor_iju[3], -1);
  EXPECT_EQ(m->state, SM_STATE_SYMBOLIC);
}

TEST_P(SymbolicTest, a_tridiagonal_matrix_in_natural_order_has_one_entry_a_row) {
  const Indices natural = natural_order(6);
  SmMatrix* m = reordered_matrix(path(6), &natural);
  ASSERT_EQ(qxsmsymbfact(m), SM_OK);
  EXPECT_EQ(words(m->factor_iu, 7), (Indices{0, 1, 2, 3, 4, 5, 5}));
  EXPECT_EQ(stored_structure(m), (std::vector<Indices>{{1}, {2}, {3}, {4}, {5}, {}}));
  // A row of one entry updates no later row, so that each of them keeps its own subscript.
  EXPECT_EQ(words(m->factor_ju, 5), (Indices{1, 2, 3, 4, 5}));
}

TEST_P(SymbolicTest, a_full_matrix_stores_the_subscripts_of_its_first_row_only) {
  const Indices natural = natural_order(9);
  SmMatrix* m = reordered_matrix(clique(9), &natural);
  ASSERT_EQ(qxsmsymbfact(m), SM_OK);
  EXPECT_EQ(m->factor_iu[9], 36);
  EXPECT_EQ(m->factor_iju[8], 7);
  EXPECT_EQ(words(m->factor_iju, 8), (Indices{0, 1, 2, 3, 4, 5, 6, 7}));
  EXPECT_EQ(words(m->factor_ju, 8), (Indices{1, 2, 3, 4, 5, 6, 7, 8}));
}

TEST_P(SymbolicTest, a_block_that_continues_the_last_one_shares_its_tail) {
  // Rows {2, 3} and {3, 4}: no row updates row 1, and its subscripts begin where those of row 0 end.
  const Graph graph{5, {{0, 2}, {0, 3}, {1, 3}, {1, 4}}};
  const Indices natural = natural_order(5);
  SmMatrix* m = reordered_matrix(graph, &natural);
  ASSERT_EQ(qxsmsymbfact(m), SM_OK);
  EXPECT_EQ(words(m->factor_ju, 3), (Indices{2, 3, 4}));
  EXPECT_EQ(m->factor_iju[0], 0);
  EXPECT_EQ(m->factor_iju[1], 1);
}

TEST_P(SymbolicTest, subscripts_ascend_in_every_row) {
  SmMatrix* m = reordered_matrix(grid(8, 8));
  ASSERT_EQ(qxsmsymbfact(m), SM_OK);
  for (const Indices& row : stored_structure(m)) {
    EXPECT_TRUE(std::is_sorted(row.begin(), row.end()));
    EXPECT_TRUE(std::adjacent_find(row.begin(), row.end()) == row.end());
  }
  EXPECT_LT(m->factor_iju[63] + 1, m->factor_iu[64]);
}

TEST_P(SymbolicTest, a_workspace_too_small_grows_by_the_shortfall_and_gives_the_same_structure) {
  Random random(4);
  for (const Graph& graph : {empty_graph(6), path(9), clique(9), grid(5, 5), arrowhead(14, 2), star(10, 0),
                             random_graph(random, 24, 15), blocks(random, 3, 5)}) {
    const std::int64_t n = graph.n;
    const Indices order = random.permutation(n);
    SmMatrix* large = reordered_matrix(graph, &order);
    ASSERT_EQ(qxsmsymbfact(large), SM_OK);
    const std::vector<Indices> want = stored_structure(large);
    const std::int64_t needed = words_needed(large);
    EXPECT_EQ(want, true_fill(graph, order));
    Indices capacities = {3 * n + 1, 4 * n, 5 * n, needed - 1, needed, needed + 1};
    for (std::int64_t c = 5 * n + 1; c < needed; c += 3) capacities.push_back(c);
    for (const std::int64_t capacity : capacities) {
      SmMatrix* m = reordered_matrix(graph, &order);
      replace_work(m, capacity);
      const std::int64_t blocks_before = host().live_blocks();
      ASSERT_EQ(qxsmsymbfact(m), SM_OK) << n << " rows, " << capacity << " words";
      expect_well_formed(m);
      EXPECT_EQ(stored_structure(m), want) << n << " rows, " << capacity << " words";
      EXPECT_EQ(m->work_capacity, std::max(capacity, needed)) << n << " rows, " << capacity << " words";
      EXPECT_EQ(host().live_blocks(), blocks_before);
      EXPECT_EQ(qxsmnumfact(m), SM_OK);
      destroy(m);
    }
  }
}

TEST_P(SymbolicTest, a_workspace_that_is_just_large_enough_stays) {
  SmMatrix* large = reordered_matrix(grid(5, 5));
  ASSERT_EQ(qxsmsymbfact(large), SM_OK);
  SmMatrix* m = reordered_matrix(grid(5, 5));
  replace_work(m, words_needed(large));
  const std::int64_t* work = m->work;
  host().fail_request(0, true);
  EXPECT_EQ(qxsmsymbfact(m), SM_OK);
  EXPECT_EQ(host().stop_failing(), 0);  // nothing was asked for
  EXPECT_EQ(m->work, work);
}

TEST_P(SymbolicTest, the_smallest_workspace_that_ordering_leaves_serves) {
  Random random(9);
  for (int trial = 0; trial < 60; ++trial) {
    const Graph graph = any_graph(random, 16);
    if (graph.n == 0) continue;
    SmMatrix* m = new_sparse(session(), positive_definite(graph, random));
    m->work_capacity = 1 + random.below(3 * graph.n);
    ASSERT_EQ(bring_to(m, SM_STATE_SYMBOLIC), SM_OK);
    expect_well_formed(m);
    EXPECT_EQ(stored_structure(m), true_fill(graph, words(m->perm, graph.n)));
    EXPECT_EQ(qxsmnumfact(m), SM_OK);
    destroy(m);
  }
}

TEST_P(SymbolicTest, a_larger_workspace_that_is_refused_leaves_the_matrix_reordered) {
  const Graph graph = grid(4, 4);
  std::int64_t refused = 0;
  for (std::int64_t k = 0; k < 100; ++k) {
    SmMatrix* m = reordered_matrix(graph);
    replace_work(m, 5 * 16 + 1);
    const StoredRows rows = rows_of(m);
    const std::int64_t loose = host().live_blocks() - owned_blocks(m);
    host().fail_request(k, false);
    const SmStatus status = qxsmsymbfact(m);
    if (host().stop_failing() == 0) {
      EXPECT_EQ(status, SM_OK);
      break;
    }
    ++refused;
    EXPECT_EQ(status, SM_NO_MEMORY) << "request " << k;
    EXPECT_EQ(m->state, SM_STATE_REORDERED);
    EXPECT_TRUE(rows_of(m) == rows);
    EXPECT_EQ(host().live_blocks() - owned_blocks(m), loose);
    EXPECT_EQ(qxsmsymbfact(m), SM_OK);
    expect_well_formed(m);
    EXPECT_EQ(stored_structure(m), true_fill(graph, words(m->perm, 16)));
  }
  EXPECT_GE(refused, 1);
}

TEST_P(SymbolicTest, a_column_held_twice_answers_106_and_leaves_the_matrix_reordered) {
  SmMatrix* m = new_sparse(session(), problem_of({{8, 1, 2, 0}, {0, 8, 0, 1}, {0, 0, 8, 1}, {0, 0, 0, 8}}));
  m->col_index[2] = 1;  // row 0 holds (0, 1) twice
  ASSERT_EQ(qxsmmd(m), SM_OK);
  ASSERT_EQ(qxsmreorder(m), SM_OK);
  const std::int64_t blocks = host().live_blocks();
  EXPECT_EQ(qxsmsymbfact(m), SM_SYMBOLIC_FAILED);
  EXPECT_EQ(m->state, SM_STATE_REORDERED);
  EXPECT_EQ(host().live_blocks(), blocks);
  EXPECT_EQ(qxsmsymbfact(m), SM_SYMBOLIC_FAILED);
  EXPECT_EQ(qxsmnumfact(m), SM_WRONG_STATE);
  EXPECT_EQ(fn().qxsmfact(m, 0), SM_SYMBOLIC_FAILED);
  EXPECT_EQ(m->state, SM_STATE_REORDERED);
}

TEST_P(SymbolicTest, runs_once) {
  SmMatrix* m = reordered_matrix(grid(3, 3));
  ASSERT_EQ(qxsmsymbfact(m), SM_OK);
  const std::vector<Indices> structure = stored_structure(m);
  EXPECT_EQ(qxsmsymbfact(m), SM_OK);
  EXPECT_EQ(m->state, SM_STATE_SYMBOLIC);
  ASSERT_EQ(qxsmnumfact(m), SM_OK);
  const std::vector<double> reciprocals = stored_reciprocals(m);
  EXPECT_EQ(qxsmsymbfact(m), SM_OK);
  EXPECT_EQ(m->state, SM_STATE_FACTORED);
  EXPECT_EQ(stored_structure(m), structure);
  EXPECT_EQ(stored_reciprocals(m), reciprocals);
}

TEST_P(SymbolicTest, its_checks_come_in_order) {
  SmMatrix* empty = new_sparse(session(), Problem{"empty", 0, {}}, false);
  EXPECT_EQ(qxsmsymbfact(empty), SM_OK);  // before anything about states
  EXPECT_EQ(qxsmsymbfact(new_untyped(session())), SM_OK);

  SmMatrix* none = new_untyped(session());
  none->nnz = 1;
  none->state = SM_STATE_SYMBOLIC;
  EXPECT_EQ(qxsmsymbfact(none), SM_OK);  // state 4 before the kind
  for (const std::int32_t state : {SM_STATE_OPEN, SM_STATE_CLOSED, SM_STATE_REORDERED, SM_STATE_FACTORED}) {
    none->state = state;
    EXPECT_EQ(qxsmsymbfact(none), SM_UNTYPED);
  }
  none->nnz = 0;
  none->state = SM_STATE_OPEN;

  const Problem problem = problem_of({{2, 1}, {0, 2}});
  SmMatrix* sparse = new_sparse(session(), problem, false);
  EXPECT_EQ(qxsmsymbfact(sparse), SM_NOT_CLOSED);
  EXPECT_EQ(sparse->state, SM_STATE_OPEN);
  ASSERT_EQ(fn().qxsmclose(sparse, 0.0), SM_OK);
  EXPECT_EQ(qxsmsymbfact(sparse), SM_WRONG_STATE);
  EXPECT_EQ(sparse->state, SM_STATE_CLOSED);
  ASSERT_EQ(qxsmmd(sparse), SM_OK);
  EXPECT_EQ(qxsmsymbfact(sparse), SM_WRONG_STATE);
  EXPECT_EQ(sparse->state, SM_STATE_ORDERED);
}

TEST_P(SymbolicTest, what_is_not_symmetric_sparse_has_no_symbolic_factor) {
  const Problem problem = problem_of({{2, 1}, {0, 2}});
  std::vector<double> data(3, 1.0);
  EXPECT_EQ(qxsmsymbfact(new_open_tied(session(), data, 2, 2, SM_KIND_SYMMETRIC, SM_FORMAT_ROWS)), SM_NOT_CLOSED);
  SmMatrix* packed_matrix = new_packed(session(), problem, SM_FORMAT_ROWS);
  EXPECT_EQ(qxsmsymbfact(packed_matrix), SM_WRONG_STATE);
  EXPECT_EQ(qxsmsymbfact(new_general(session(), 2, 2)), SM_WRONG_STATE);
  ASSERT_EQ(fn().qxsmfact(packed_matrix, 0), SM_OK);
  EXPECT_EQ(qxsmsymbfact(packed_matrix), SM_OK);  // state 5
  EXPECT_EQ(packed_matrix->state, SM_STATE_FACTORED);
}

}  // namespace
}  // namespace sm::test
