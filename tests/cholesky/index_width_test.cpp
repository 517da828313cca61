// Steps that keep their indices in half words where these reach, forced to either width.
#include <algorithm>
#include <string>

#include "cholesky/cholesky_support.hpp"
#include "cholesky/rank_sort.hpp"
#include "cholesky/reorder.hpp"
#include "cholesky/structure_reference.hpp"
#include "cholesky/symbolic.hpp"

namespace sm::test {
namespace {

class IndexWidthTest : public OrderedTest {
 protected:
  // The same matrix each time; in a random order where `shuffled`, with no room but for the targets where `tight`.
  SmMatrix* ordered_again(const Problem& problem, std::uint64_t seed, bool shuffled, bool tight) {
    Random random(seed);
    SmMatrix* m = ordered(problem);
    if (shuffled) impose_order(m, random.permutation(problem.n));
    if (tight) replace_work(m, problem.n + m->nnz);
    return m;
  }
};
INSTANTIATE_BOTH_HOSTS(IndexWidthTest);

void expect_rows(const StoredRows& got, const StoredRows& want, const std::string& what) {
  EXPECT_EQ(got.row_start, want.row_start) << what;
  EXPECT_EQ(got.col_index, want.col_index) << what;
  EXPECT_EQ(got.value_bits, want.value_bits) << what;
}

// Long rows with links everywhere take the other road through the entries.
Graph with_long_rows(Random& random, std::int64_t n) {
  Graph g = random_graph(random, n, 4);
  const std::int64_t hub = random.below(n);
  for (std::int64_t j = 0; j < n; ++j)
    if (j != hub) g.edges.emplace_back(std::min(hub, j), std::max(hub, j));
  std::sort(g.edges.begin(), g.edges.end());
  g.edges.erase(std::unique(g.edges.begin(), g.edges.end()), g.edges.end());
  return g;
}

Graph some_graph(Random& random) {
  return random.chance(20) ? with_long_rows(random, 60 + random.below(90)) : any_graph(random, 50);
}

TEST_P(IndexWidthTest, moves_entries_to_the_same_places_with_half_and_with_whole_words) {
  for (std::uint64_t seed = 0; seed < 300; ++seed) {
    Random random(seed);
    const Graph graph = some_graph(random);
    if (graph.n == 0) continue;
    const Problem problem = positive_definite(graph, random);
    const bool shuffled = random.chance(60);
    const bool tight = random.chance(50);
    for (const IndexWidth width : {IndexWidth::half, IndexWidth::whole}) {
      SmMatrix* m = ordered_again(problem, seed, shuffled, tight);
      const StoredRows want = reordered_rows(m);
      reorder_rows(*m, width);
      expect_rows(rows_of(m), want,
                  "seed " + std::to_string(seed) + (width == IndexWidth::half ? ", half words" : ", whole words"));
      destroy(m);
    }
    if (HasFailure()) return;
  }
}

TEST_P(IndexWidthTest, finds_the_true_fill_with_half_and_with_whole_words) {
  for (std::uint64_t seed = 0; seed < 200; ++seed) {
    Random random(seed);
    const Graph graph = some_graph(random);
    if (graph.n == 0) continue;
    const Problem problem = positive_definite(graph, random);
    const bool shuffled = random.chance(60);
    for (const IndexWidth width : {IndexWidth::half, IndexWidth::whole}) {
      SmMatrix* m = ordered_again(problem, seed, shuffled, false);
      const Indices perm = words(m->perm, graph.n);
      ASSERT_EQ(qxsmreorder(m), SM_OK);
      ASSERT_EQ(factor_symbolic(*m, width), SM_OK);
      EXPECT_EQ(stored_structure(m), true_fill(graph, perm)) << "seed " << seed;
      EXPECT_EQ(words(m->factor_ju, m->factor_iju[graph.n - 1] + 1), compressed_subscripts(graph, perm))
          << "seed " << seed;
      destroy(m);
    }
    if (HasFailure()) return;
  }
}

TEST(IndexWidthRulesTest, half_words_serve_up_to_their_largest_value) {
  EXPECT_EQ(width_for<std::uint32_t>(4294967295), IndexWidth::half);
  EXPECT_EQ(width_for<std::uint32_t>(4294967296), IndexWidth::whole);
  EXPECT_EQ(width_for<std::int32_t>(2147483647), IndexWidth::half);
  EXPECT_EQ(width_for<std::int32_t>(2147483648), IndexWidth::whole);
}

TEST(RankSortTest, sorts_lists_of_every_length_and_leaves_what_is_behind_them) {
  Random random(3);
  for (std::int64_t count = 0; count <= kRankSorted; ++count) {
    for (const std::int64_t first : {std::int64_t{0}, std::int64_t{77}, std::int64_t{1} << 40}) {
      Indices list;
      for (std::int64_t t = 0; t < count; ++t) list.push_back(first + 3 * t);
      if (count > 0) list.back() = first + kRankReach - 1;  // the last column that is in reach
      Indices want = list;
      const Indices places = random.permutation(count);
      for (std::int64_t t = 0; t < count; ++t)
        list[static_cast<std::size_t>(t)] = want[static_cast<std::size_t>(places[static_cast<std::size_t>(t)])];
      list.push_back(-5);
      want.push_back(-5);
      sort_by_ranks(list.data(), count, first);
      EXPECT_EQ(list, want) << count << " columns from " << first << " on";
    }
  }
}

// Rows whose columns are too few among those to come for a bitmap: 11 to 13, where comparing ends, and 63 to 66, where
// ranks end.
TEST_P(IndexWidthTest, finds_rows_of_few_columns_far_apart) {
  for (const std::int64_t columns : {11, 12, 13, 16, 17, 40, 63, 64, 65, 66}) {
    const std::int64_t n = 600 * columns;
    Graph graph{n, {}};
    Random random(static_cast<std::uint64_t>(columns));
    for (std::int64_t row = 0; row < 5; ++row)
      for (std::int64_t c = 0; c < columns; ++c) graph.edges.emplace_back(row, 5 + 590 * c + random.below(590));
    const Problem problem = positive_definite(graph, random);
    SmMatrix* m = ordered(problem);
    Indices order = random.permutation(n - 5);
    for (std::int64_t& row : order) row += 5;
    for (std::int64_t row = 0; row < 5; ++row) order.insert(order.begin() + row, row);
    impose_order(m, order);
    ASSERT_EQ(qxsmreorder(m), SM_OK);
    ASSERT_EQ(qxsmsymbfact(m), SM_OK);
    for (std::int64_t row = 0; row < 5; ++row) {
      Indices want;
      for (std::int64_t c = 0; c < columns; ++c)
        want.push_back(m->inv_perm[graph.edges[static_cast<std::size_t>(row * columns + c)].second]);
      std::sort(want.begin(), want.end());
      EXPECT_EQ(words(m->factor_ju + m->factor_iju[row], columns), want) << columns << " columns, row " << row;
    }
    destroy(m);
  }
}

}  // namespace
}  // namespace sm::test
