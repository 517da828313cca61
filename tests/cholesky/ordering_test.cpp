#include <cmath>

#include "cholesky/cholesky_support.hpp"
#include "cholesky/ordering_reference.hpp"

namespace sm::test {
namespace {

class OrderingTest : public ModuleTest {
 protected:
  SmMatrix* closed(const Graph& graph) {
    Random random(static_cast<std::uint64_t>(graph.n));
    return new_sparse(session(), positive_definite(graph, random));
  }
  // A block of the matrix's own pool, as the ordering would have taken it.
  std::int64_t* block(SmMatrix* m, std::int64_t count) {
    return static_cast<std::int64_t*>(m->pool->allocate(m->pool, static_cast<std::uint64_t>(count) * 8, 0));
  }
  void destroy(SmMatrix* m) { EXPECT_EQ(fn().qxsmDestroyMatrix(instance(), &m), SM_OK); }
};
INSTANTIATE_BOTH_HOSTS(OrderingTest);

void expect_permutation(const SmMatrix* m) {
  for (std::int64_t k = 0; k < m->rows; ++k) {
    ASSERT_GE(m->perm[k], 0);
    ASSERT_LT(m->perm[k], m->rows);
    EXPECT_EQ(m->inv_perm[m->perm[k]], k);
  }
}

// The capacity of the first workspace that holds the element lists: it starts at `given` (or a size from n and nnz) and
// grows by nnz. Two slots an edge after n slots for the vertices, in each half of what the n list heads leave.
std::int64_t expected_capacity(const SmMatrix* m, std::int64_t given, std::int64_t edges) {
  std::int64_t capacity = given == 0 ? 4 * m->rows + 4 * m->nnz : given;
  for (;;) {
    capacity += m->nnz;
    const std::int64_t half = capacity < m->rows ? -1 : (capacity - m->rows) / 2;
    if (half >= m->rows && (edges == 0 || m->rows + 1 + 2 * (edges - 1) < half)) return capacity;
  }
}

TEST_P(OrderingTest, orders_random_graphs_exactly_as_the_reference_does) {
  for (std::uint64_t seed = 0; seed < 4000; ++seed) {
    Random random(seed);
    const Graph graph = any_graph(random, 61);
    SmMatrix* m = closed(graph);
    const StoredRows before = rows_of(m);
    ASSERT_EQ(qxsmmd(m), SM_OK) << "seed " << seed;
    if (graph.n > 0) {
      ASSERT_EQ(m->state, SM_STATE_ORDERED) << "seed " << seed;
      ASSERT_EQ(words(m->perm, graph.n), minimum_degree_reference(graph)) << "seed " << seed;
      expect_permutation(m);
      EXPECT_EQ(m->work_capacity, 4 * graph.n + 5 * m->nnz);
    }
    EXPECT_TRUE(rows_of(m) == before) << "seed " << seed;
    destroy(m);
    if (HasFailure()) FAIL() << "seed " << seed;
  }
}

TEST_P(OrderingTest, orders_every_graph_of_up_to_five_vertices_as_the_reference_does) {
  for (std::int64_t n = 0; n <= 5; ++n) {
    const Graph all = clique(n);
    for (std::uint64_t chosen = 0; chosen < (1U << all.edges.size()); ++chosen) {
      Graph graph{n, {}};
      for (std::size_t e = 0; e < all.edges.size(); ++e)
        if (chosen >> e & 1U) graph.edges.push_back(all.edges[e]);
      SmMatrix* m = closed(graph);
      ASSERT_EQ(qxsmmd(m), SM_OK);
      if (n > 0) {
        ASSERT_EQ(words(m->perm, n), minimum_degree_reference(graph)) << n << " vertices, edges " << chosen;
        expect_permutation(m);
      }
      destroy(m);
    }
  }
}

TEST_P(OrderingTest, orders_larger_grids_and_dense_graphs_as_the_reference_does) {
  Random random(7);
  const std::vector<Graph> graphs = {grid(15, 17),
                                     relabelled(grid(12, 12), random.permutation(144)),
                                     clique(70),
                                     arrowhead(150, 3),
                                     blocks(random, 9, 9),
                                     random_graph(random, 120, 10),
                                     path(200),
                                     random_tree(random, 250),
                                     elements(random, 150, 60, 6),
                                     multiplied(random, grid(8, 9))};
  for (const Graph& graph : graphs) {
    SmMatrix* m = closed(graph);
    ASSERT_EQ(qxsmmd(m), SM_OK);
    EXPECT_EQ(words(m->perm, graph.n), minimum_degree_reference(graph)) << graph.n << " vertices";
    expect_permutation(m);
    destroy(m);
  }
}

TEST_P(OrderingTest, a_matrix_without_edges_is_ordered_from_the_last_row_to_the_first) {
  SmMatrix* m = closed(empty_graph(5));
  ASSERT_EQ(qxsmmd(m), SM_OK);
  EXPECT_EQ(words(m->perm, 5), (Indices{4, 3, 2, 1, 0}));
  EXPECT_EQ(words(m->inv_perm, 5), (Indices{4, 3, 2, 1, 0}));
}

TEST_P(OrderingTest, entries_below_the_diagonal_create_no_edges) {
  SmMatrix* m = closed(path(4));  // rows {0, 1}, {1, 2}, {2, 3}, {3}
  m->col_index[1] = 0;            // two diagonals in row 0
  m->col_index[3] = 0;            // (1, 0) instead of (1, 2)
  m->col_index[5] = 0;            // (2, 0) instead of (2, 3)
  const StoredRows before = rows_of(m);
  ASSERT_EQ(qxsmmd(m), SM_OK);
  EXPECT_EQ(words(m->perm, 4), (Indices{3, 2, 1, 0}));
  EXPECT_TRUE(rows_of(m) == before);
}

TEST_P(OrderingTest, a_repeated_entry_counts_once) {
  Random random(11);
  for (int trial = 0; trial < 50; ++trial) {
    Graph graph = random_graph(random, 12, 40);
    SmMatrix* m = closed(graph);
    for (std::int64_t i = 0; i < 12; ++i)
      for (std::int64_t p = m->row_start[i] + 2; p < m->row_start[i + 1]; ++p)
        if (random.chance(30)) m->col_index[p] = m->col_index[p - 1 - random.below(p - m->row_start[i] - 1)];
    graph.edges.clear();
    for (std::int64_t i = 0; i < 12; ++i)
      for (std::int64_t p = m->row_start[i] + 1; p < m->row_start[i + 1]; ++p)
        graph.edges.emplace_back(i, m->col_index[p]);
    const StoredRows before = rows_of(m);
    ASSERT_EQ(qxsmmd(m), SM_OK);
    EXPECT_EQ(words(m->perm, 12), minimum_degree_reference(graph)) << "trial " << trial;
    expect_permutation(m);
    EXPECT_TRUE(rows_of(m) == before);
    destroy(m);
  }
}

TEST_P(OrderingTest, a_workspace_that_overflows_grows_and_gives_the_same_order) {
  Random random(3);
  for (const Graph& graph : {empty_graph(1), empty_graph(9), path(2), path(30), clique(12), grid(5, 5), star(20, 4),
                             random_graph(random, 25, 30), arrowhead(20, 2)}) {
    const Indices want = minimum_degree_reference(graph);
    for (const std::int64_t given :
         {std::int64_t{1}, graph.n, 2 * graph.n + 1, 3 * graph.n - 1, 3 * graph.n, 3 * graph.n + 1, 4 * graph.n}) {
      SmMatrix* m = closed(graph);
      const StoredRows before = rows_of(m);
      m->work_capacity = given;
      const std::int64_t blocks = host().live_blocks();
      ASSERT_EQ(qxsmmd(m), SM_OK);
      EXPECT_EQ(host().live_blocks(), blocks + 3);  // smaller ones went back
      EXPECT_EQ(words(m->perm, graph.n), want) << "from " << given;
      EXPECT_EQ(m->work_capacity, expected_capacity(m, given, static_cast<std::int64_t>(graph.edges.size())))
          << graph.n << " vertices from " << given;
      EXPECT_TRUE(rows_of(m) == before);
      expect_permutation(m);
      destroy(m);
    }
  }
}

TEST_P(OrderingTest, permutation_arrays_that_are_there_are_used_and_a_missing_one_is_allocated) {
  const Graph graph = grid(4, 4);
  const Indices want = minimum_degree_reference(graph);
  for (const bool with_perm : {false, true})
    for (const bool with_inverse : {false, true}) {
      SmMatrix* m = closed(graph);
      std::int64_t* perm = with_perm ? block(m, 16) : nullptr;
      std::int64_t* inverse = with_inverse ? block(m, 16) : nullptr;
      m->perm = perm;
      m->inv_perm = inverse;
      ASSERT_EQ(qxsmmd(m), SM_OK);
      ASSERT_NE(m->perm, nullptr);
      ASSERT_NE(m->inv_perm, nullptr);
      if (with_perm) {
        EXPECT_EQ(m->perm, perm);
      }
      if (with_inverse) {
        EXPECT_EQ(m->inv_perm, inverse);
      }
      EXPECT_EQ(words(m->perm, 16), want);
      expect_permutation(m);
    }
}

TEST_P(OrderingTest, ordering_again_or_later_does_nothing) {
  SmMatrix* m = closed(grid(3, 3));
  for (const std::int32_t state : {SM_STATE_ORDERED, SM_STATE_REORDERED, SM_STATE_SYMBOLIC, SM_STATE_FACTORED}) {
    while (m->state < state) ASSERT_EQ(bring_to(m, m->state + 1), SM_OK);
    const Indices perm = words(m->perm, 9);
    const StoredRows rows = rows_of(m);
    const std::int64_t blocks = host().live_blocks();
    EXPECT_EQ(qxsmmd(m), SM_OK);
    EXPECT_EQ(m->state, state);
    EXPECT_EQ(words(m->perm, 9), perm);
    EXPECT_TRUE(rows_of(m) == rows);
    EXPECT_EQ(host().live_blocks(), blocks);
  }
}

TEST_P(OrderingTest, takes_three_blocks_and_leaves_no_other) {
  SmMatrix* m = closed(grid(3, 3));
  const std::int64_t blocks = host().live_blocks();
  ASSERT_EQ(qxsmmd(m), SM_OK);
  EXPECT_EQ(host().live_blocks(), blocks + 3);
}

TEST_P(OrderingTest, answers_0_for_an_empty_matrix_of_any_kind_and_state) {
  for (SmMatrix* m : {closed(empty_graph(0)), new_general(session(), 0, 0), new_untyped(session())}) {
    const std::int32_t state = m->state;
    EXPECT_EQ(qxsmmd(m), SM_OK);
    EXPECT_EQ(m->state, state);
    EXPECT_EQ(m->perm, nullptr);
  }
}

TEST_P(OrderingTest, answers_1_for_kind_none_before_anything_about_format_and_state) {
  SmMatrix* m = new_untyped(session());
  m->nnz = 1;
  for (const std::int32_t state : {SM_STATE_OPEN, SM_STATE_CLOSED, SM_STATE_FACTORED}) {
    m->state = state;
    EXPECT_EQ(qxsmmd(m), SM_UNTYPED);
  }
  m->nnz = 0;
  m->state = SM_STATE_OPEN;
}

TEST_P(OrderingTest, answers_112_for_what_is_not_symmetric_sparse_whatever_its_state) {
  std::vector<double> data(9, 1.0);
  Random random(1);
  const Problem spd = positive_definite(path(3), random);
  SmMatrix* factored = new_packed(session(), spd, SM_FORMAT_ROWS);
  ASSERT_EQ(fn().qxsmfact(factored, 0), SM_OK);
  for (SmMatrix* m :
       {new_general(session(), 3, 3), new_packed(session(), spd, SM_FORMAT_COLUMNS), factored,
        new_diagonal(session(), {1.0, 2.0}), new_open_tied(session(), data, 3, 3, SM_KIND_GENERAL, SM_FORMAT_ROWS)}) {
    const std::int32_t state = m->state;
    EXPECT_EQ(qxsmmd(m), SM_NOT_SYMMETRIC_SPARSE);
    EXPECT_EQ(m->state, state);
  }
  SmMatrix* sparse = make(SM_KIND_GENERAL, SM_FORMAT_SPARSE, 3, 3);
  ASSERT_EQ(fn().qxsmassign(sparse, 0, 0, 0, 1.0), SM_OK);
  EXPECT_EQ(qxsmmd(sparse), SM_NOT_SYMMETRIC_SPARSE);
}

TEST_P(OrderingTest, answers_102_for_an_open_matrix) {
  Random random(1);
  SmMatrix* m = new_sparse(session(), positive_definite(path(3), random), false);
  EXPECT_EQ(qxsmmd(m), SM_WRONG_STATE);
  EXPECT_EQ(m->state, SM_STATE_OPEN);
}

TEST_P(OrderingTest, answers_105_when_the_workspace_would_reach_two_to_the_53rd) {
  SmMatrix* m = closed(path(3));
  const StoredRows before = rows_of(m);
  for (const std::int64_t given : {SM_MAX_ELEMENTS - m->nnz, SM_MAX_ELEMENTS - 1, SM_MAX_ELEMENTS}) {
    m->work_capacity = given;
    EXPECT_EQ(qxsmmd(m), SM_TOO_LARGE);
    EXPECT_EQ(m->state, SM_STATE_CLOSED);
    EXPECT_TRUE(rows_of(m) == before);
  }
  m->work_capacity = 0;
  EXPECT_EQ(qxsmmd(m), SM_OK);
  EXPECT_EQ(words(m->perm, 3), minimum_degree_reference(path(3)));
}

TEST_P(OrderingTest, a_refused_block_leaves_the_matrix_closed_and_its_rows_as_they_were) {
  for (std::int64_t k = 0; k < 3; ++k) {
    SmMatrix* m = closed(grid(3, 3));
    const StoredRows before = rows_of(m);
    const std::int64_t loose = host().live_blocks() - owned_blocks(m);
    host().fail_request(k, true);
    EXPECT_EQ(qxsmmd(m), SM_NO_MEMORY) << "request " << k;
    EXPECT_GT(host().stop_failing(), 0);
    EXPECT_EQ(m->state, SM_STATE_CLOSED);
    EXPECT_TRUE(rows_of(m) == before);
    EXPECT_EQ(host().live_blocks() - owned_blocks(m), loose);
    EXPECT_EQ(qxsmmd(m), SM_OK);
    EXPECT_EQ(words(m->perm, 9), minimum_degree_reference(grid(3, 3)));
  }
}

// Behind the two permutations and the workspace a small workspace asks for one block more, which it can do without.
TEST_P(OrderingTest, a_block_refused_beside_a_small_workspace_leaves_the_rows_as_they_were) {
  const Graph graph = path(8);
  const Indices want = minimum_degree_reference(graph);
  for (std::int64_t k = 0;; ++k) {
    SmMatrix* m = closed(graph);
    m->work_capacity = 1;
    const StoredRows before = rows_of(m);
    host().fail_request(k, false);
    const SmStatus status = qxsmmd(m);
    const bool met = host().stop_failing() > 0;
    EXPECT_TRUE(rows_of(m) == before);
    EXPECT_EQ(met, k < 4);
    EXPECT_EQ(status, k < 3 ? SM_NO_MEMORY : SM_OK) << "request " << k;
    if (!met) break;
    if (status != SM_OK) {
      EXPECT_EQ(m->state, SM_STATE_CLOSED);
      EXPECT_EQ(qxsmmd(m), SM_OK);
    }
    EXPECT_EQ(words(m->perm, 8), want);
  }
}

}  // namespace
}  // namespace sm::test
