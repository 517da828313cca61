// The ordering's roads against each other: the plain one says what the order is.
#include <algorithm>

#include "cholesky/cholesky_support.hpp"
#include "cholesky/hub_graphs.hpp"
#include "cholesky/ordering.hpp"

namespace sm::test {
namespace {

class OrderingRoadsTest : public ModuleTest {
 protected:
  SmMatrix* closed(const Graph& graph) {
    Random random(static_cast<std::uint64_t>(graph.n));
    return new_sparse(session(), positive_definite(graph, random));
  }
  void destroy(SmMatrix* m) { ASSERT_EQ(fn().qxsmDestroyMatrix(instance(), &m), SM_OK); }

  // Forgets the ordering, so that the matrix can be ordered again.
  static void forget(SmMatrix* m, std::int64_t capacity = 0) {
    m->state = SM_STATE_CLOSED;
    m->work_capacity = capacity;
  }

  struct Answer {
    SmStatus status = SM_OK;
    Indices perm;
    Indices inv_perm;
    std::int64_t capacity = 0;
    bool operator==(const Answer&) const = default;
  };
  static Answer order_again(SmMatrix* m, Road road, std::int64_t capacity = 0) {
    forget(m, capacity);
    Answer answer;
    answer.status = order_by(*m, road);
    if (answer.status == SM_OK) {
      answer.perm = words(m->perm, m->rows);
      answer.inv_perm = words(m->inv_perm, m->rows);
    }
    answer.capacity = m->work_capacity;
    return answer;
  }

  // Every road, from the first size of the workspace and from small ones, answers what the plain one does.
  static void expect_one_order(SmMatrix* m, Random& random) {
    for (const std::int64_t capacity : {std::int64_t{0}, 1 + random.below(6 * m->rows)}) {
      const Answer plain = order_again(m, Road::plain, capacity);
      EXPECT_EQ(plain.status, SM_OK);
      EXPECT_TRUE(order_again(m, Road::narrow, capacity) == plain) << "narrow index";
      EXPECT_TRUE(order_again(m, Road::wide, capacity) == plain) << "wide index";
      EXPECT_TRUE(order_again(m, Road::best, capacity) == plain) << "chosen road";
    }
  }
  void expect_one_order(const Graph& graph, Random& random) {
    SmMatrix* m = closed(graph);
    expect_one_order(m, random);
    destroy(m);
  }
};
INSTANTIATE_BOTH_HOSTS(OrderingRoadsTest);

TEST_P(OrderingRoadsTest, random_graphs_of_every_family_get_one_order) {
  for (std::uint64_t seed = 0; seed < 1500; ++seed) {
    Random random(seed);
    const Graph graph = any_graph(random, 70);
    if (graph.n > 0) expect_one_order(graph, random);
    if (HasFailure()) FAIL() << "seed " << seed;
  }
}

TEST_P(OrderingRoadsTest, designs_with_hubs_get_one_order) {
  for (std::uint64_t seed = 0; seed < 1000; ++seed) {
    Random random(seed);
    const Graph graph = any_hub_graph(random, 150);
    expect_one_order(graph, random);
    expect_one_order(relabelled(graph, random.permutation(graph.n)), random);
    if (HasFailure()) FAIL() << "seed " << seed;
  }
}

TEST_P(OrderingRoadsTest, larger_designs_get_one_order) {
  Random random(5);
  const std::vector<Graph> graphs = {crossed(random, 40, 1500, 4),
                                     crossed(random, 300, 900, 12),
                                     pedigree(random, 3000, 6),
                                     mixed_model(random, 700, 150, 20),
                                     grid(60, 60),
                                     brick(13, 13, 13),
                                     with_hubs(random, grid(40, 40), 30, 30),
                                     wheel(3000),
                                     chained(random, 400, 6),
                                     arrowhead(4000, 1)};
  for (const Graph& graph : graphs) {
    expect_one_order(graph, random);
    EXPECT_FALSE(HasFailure()) << graph.n << " vertices";
  }
}

// So large that the vertices left at the end take many words, and are halved more than once.
TEST_P(OrderingRoadsTest, designs_with_long_ends_get_one_order) {
  for (std::uint64_t seed = 0; seed < 2; ++seed) {
    Random random(seed);
    expect_one_order(mixed_model(random, 1500, 600 + random.below(600), 8 + random.below(12)), random);
    expect_one_order(pedigree(random, 4000, 5 + random.below(40)), random);
    EXPECT_FALSE(HasFailure()) << "seed " << seed;
  }
}

// Late in an elimination boundaries become bits where the workspace has room for them beside the graph: from the start
// in some of these sizes, and when half of the vertices have gone again; in others it is refused each time.
TEST_P(OrderingRoadsTest, one_order_comes_from_a_workspace_of_any_size) {
  Random random(7);
  Graph graph = pedigree(random, 6000, 12);
  const Graph beside = crossed(random, 250, 4000, 3);
  for (const auto& [i, j] : beside.edges) graph.edges.emplace_back(graph.n + i, graph.n + j);
  graph.n += beside.n;
  SmMatrix* m = closed(graph);
  const Answer plain = order_again(m, Road::plain);
  for (std::int64_t k = 0; k < 8; ++k) {
    const Answer narrow = order_again(m, Road::narrow, 1 + k * m->nnz / 8);
    EXPECT_EQ(narrow.status, SM_OK);
    EXPECT_TRUE(narrow.perm == plain.perm) << "workspace of " << narrow.capacity;
  }
  destroy(m);
}

TEST_P(OrderingRoadsTest, every_graph_of_up_to_four_vertices_gets_one_order) {
  Random random(1);
  for (std::int64_t n = 1; n <= 4; ++n) {
    const Graph all = clique(n);
    for (std::uint64_t chosen = 0; chosen < (1U << all.edges.size()); ++chosen) {
      Graph graph{n, {}};
      for (std::size_t e = 0; e < all.edges.size(); ++e)
        if (chosen >> e & 1U) graph.edges.push_back(all.edges[e]);
      expect_one_order(graph, random);
      ASSERT_FALSE(HasFailure()) << n << " vertices, edges " << chosen;
    }
  }
}

// Vertices of up to 32 neighbours are kept otherwise than longer ones, and up to 64 of these as bits.
TEST_P(OrderingRoadsTest, vertices_around_the_length_that_counts_as_long_get_one_order) {
  Random random(9);
  for (const std::int64_t leaves : {31, 32, 33, 64, 65}) {
    for (const std::int64_t stars : {1, 3, 70}) {
      Graph graph{stars * (leaves + 1), {}};
      for (std::int64_t s = 0; s < stars; ++s) {
        const std::int64_t centre = s * (leaves + 1);
        for (std::int64_t leaf = 1; leaf <= leaves; ++leaf) graph.edges.emplace_back(centre, centre + leaf);
        if (s > 0) graph.edges.emplace_back(centre - 1, centre + leaves);
      }
      expect_one_order(graph, random);
      expect_one_order(relabelled(graph, random.permutation(graph.n)), random);
      ASSERT_FALSE(HasFailure()) << stars << " stars of " << leaves;
    }
  }
  for (const std::int64_t reach : {16, 17, 20, 32, 33}) {  // every vertex has twice as many neighbours
    Graph graph{200, {}};
    for (std::int64_t i = 0; i < graph.n; ++i)
      for (std::int64_t d = 1; d <= reach; ++d)
        graph.edges.emplace_back(std::min(i, (i + d) % graph.n), std::max(i, (i + d) % graph.n));
    expect_one_order(graph, random);
    expect_one_order(relabelled(graph, random.permutation(graph.n)), random);
    ASSERT_FALSE(HasFailure()) << "reach " << reach;
  }
}

// Rows in any order, repeated entries and entries below the diagonal, as no closing leaves them.
TEST_P(OrderingRoadsTest, rows_that_are_not_tidy_get_one_order) {
  for (std::uint64_t seed = 0; seed < 600; ++seed) {
    Random random(seed);
    const Graph graph = seed % 2 == 0 ? any_graph(random, 50) : any_hub_graph(random, 50);
    if (graph.n == 0) continue;
    SmMatrix* m = closed(graph);
    for (std::int64_t p = 0; p < m->nnz; ++p) {
      if (random.chance(15)) m->col_index[p] = random.below(m->rows);
      if (p > 0 && random.chance(15)) m->col_index[p] = m->col_index[p - 1];
    }
    for (std::int64_t i = 0; i < m->rows; ++i)
      for (std::int64_t p = m->row_start[i + 1] - 1; p > m->row_start[i]; --p)
        if (random.chance(30)) std::swap(m->col_index[p], m->col_index[m->row_start[i]]);
    const StoredRows before = rows_of(m);
    expect_one_order(m, random);
    EXPECT_TRUE(rows_of(m) == before);
    destroy(m);
    if (HasFailure()) FAIL() << "seed " << seed;
  }
}

// Neighbouring columns are counted several at a time; one of them may be there twice in place of the next.
TEST_P(OrderingRoadsTest, a_full_row_gets_one_order_wherever_a_column_is_missing_or_repeated) {
  Random random(4);
  Graph graph = path(60);
  for (std::int64_t j = 2; j < graph.n; ++j) graph.edges.emplace_back(0, j);
  graph.edges.emplace_back(1, graph.n - 1);  // a wheel: its rim begins where an edge to the centre is lacking
  for (std::int64_t place = 2; place < graph.n; ++place) {
    SmMatrix* m = closed(graph);
    m->col_index[place] = m->col_index[place - 1];
    expect_one_order(m, random);
    destroy(m);
    Graph lacking = graph;
    lacking.edges.erase(std::find(lacking.edges.begin(), lacking.edges.end(), std::pair{std::int64_t{0}, place}));
    expect_one_order(lacking, random);
    ASSERT_FALSE(HasFailure()) << "column " << place;
  }
}

// The narrow index needs no more than the workspace; the wide one asks the pool and gives back.
TEST_P(OrderingRoadsTest, a_road_that_cannot_have_its_memory_leaves_the_order_to_the_plain_one) {
  Random random(2);
  const Graph graph = with_hubs(random, path(81), 1, 50);
  SmMatrix* m = closed(graph);
  const Answer plain = order_again(m, Road::plain);
  const std::int64_t blocks = host().live_blocks();
  for (const Road road : {Road::narrow, Road::wide, Road::best}) {
    host().fail_request(1, true);
    EXPECT_TRUE(order_again(m, road) == plain);
    EXPECT_EQ(host().stop_failing() > 0, road == Road::wide);
    EXPECT_EQ(host().live_blocks(), blocks);
  }
  const std::int64_t least = plain.capacity - m->nnz;
  const Answer small = order_again(m, Road::plain, 1);
  ASSERT_LT(small.capacity, least);
  host().fail_request(1, true);
  EXPECT_TRUE(order_again(m, Road::narrow, 1) == small);
  EXPECT_GT(host().stop_failing(), 0);
  EXPECT_TRUE(order_again(m, Road::narrow, 1) == small);
  EXPECT_EQ(host().live_blocks(), blocks);
}

}  // namespace
}  // namespace sm::test
