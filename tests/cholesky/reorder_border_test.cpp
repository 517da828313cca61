// Borders of long rows, moved by a road of their own, against where every entry belongs.
#include <algorithm>
#include <string>
#include <utility>

#include "cholesky/cholesky_support.hpp"
#include "cholesky/reorder.hpp"

namespace sm::test {
namespace {

class ReorderBorderTest : public OrderedTest {};
INSTANTIATE_BOTH_HOSTS(ReorderBorderTest);

void expect_moved(SmMatrix* m, const std::string& what) {
  const StoredRows want = reordered_rows(m);
  ASSERT_EQ(qxsmreorder(m), SM_OK) << what;
  const StoredRows got = rows_of(m);
  EXPECT_EQ(got.row_start, want.row_start) << what;
  EXPECT_EQ(got.col_index, want.col_index) << what;
  EXPECT_EQ(got.value_bits, want.value_bits) << what;
}

// `rows` long rows in front of small blocks, linked to that part of everything behind them, and as many rows without
// them between the two where `apart`. Before them, `ahead` rows with a link to every twentieth of all.
Problem bordered(Random& random, std::int64_t rows, std::int64_t percent, bool apart, std::int64_t ahead = 0) {
  const std::int64_t first = ahead + (apart ? 2 * rows : rows);
  Graph g{first + 700 + random.below(600), {}};
  for (std::int64_t i = 0; i < ahead; ++i)
    for (std::int64_t j = i + 1; j < g.n; ++j)
      if ((i + j) % 20 == 0) g.edges.emplace_back(i, j);
  for (std::int64_t i = ahead; i < ahead + rows; ++i)
    for (std::int64_t j = i + 1; j < g.n; ++j)
      if (random.chance(percent)) g.edges.emplace_back(i, j);
  for (std::int64_t i = first; i < g.n; ++i)
    for (std::int64_t j = i + 1; j < g.n && (i - first) / 4 == (j - first) / 4; ++j) g.edges.emplace_back(i, j);
  return positive_definite(g, random);
}

// The orders of a bordered matrix: computed, as stored, the border last, and any.
void order_again(SmMatrix* m, std::int64_t which, Random& random) {
  Indices order = natural_order(m->rows);
  if (which == 2) std::reverse(order.begin(), order.end());
  if (which == 3) order = random.permutation(m->rows);
  if (which > 0) impose_order(m, order);
}

TEST_P(ReorderBorderTest, moves_the_long_rows_of_a_border_like_any_other) {
  for (std::uint64_t seed = 0; seed < 18; ++seed) {
    Random random(seed);
    constexpr std::int64_t kRows[] = {2, 3, 10, 16, 17, 35};
    constexpr std::int64_t kPercent[] = {100, 100, 99, 85};
    const std::int64_t percent = kPercent[static_cast<std::size_t>(random.below(4))];
    const bool apart = random.chance(30);
    const Problem problem = bordered(random, kRows[seed % 6], percent, apart, random.chance(50) ? 3 : 0);
    for (std::int64_t which = 0; which < 4; ++which) {
      SmMatrix* m = ordered(problem);
      order_again(m, which, random);
      if (random.chance(50)) replace_work(m, problem.n + m->nnz);  // mostly no room for the copies
      expect_moved(m, "seed " + std::to_string(seed) + " order " + std::to_string(which));
      destroy(m);
    }
  }
}

TEST_P(ReorderBorderTest, moves_a_border_in_exactly_the_room_that_its_entries_need) {
  Random random(11);
  const Problem problem = bordered(random, 5, 100, false);
  const std::int64_t n = problem.n;
  // To the rows of the blocks, when these come first in their order: an entry takes two words, or, behind the columns
  // that are walked together with the border's own, one; and a word tells where those that are walked together begin.
  const std::int64_t moving = 2 * 5 * (256 - 5) + 5 * (n - 256) + (n + 255) / 256;
  Indices order = natural_order(n);
  std::rotate(order.begin(), order.begin() + 5, order.end());
  for (const std::int64_t missing : {0, 1}) {
    SmMatrix* m = ordered(problem);
    impose_order(m, order);
    replace_work(m, 2 * n + moving - missing);
    const StoredRows before = rows_of(m);
    const StoredRows after = missing == 0 ? reordered_rows(m) : before;
    EXPECT_EQ(reorder_border(*m), missing == 0);
    EXPECT_TRUE(rows_of(m) == after) << "missing " << missing;
    destroy(m);
  }
}

TEST_P(ReorderBorderTest, moves_long_rows_that_closing_did_not_write) {
  Random random(12);
  const Problem problem = bordered(random, 4, 100, false);
  const std::int64_t n = problem.n;
  for (const std::int64_t entry : {std::int64_t{1}, std::int64_t{300}, n - 2, n + 400, 4 * n}) {
    for (std::int64_t which = 0; which < 4; ++which) {
      SmMatrix* m = ordered(problem);
      order_again(m, which, random);
      std::swap(m->col_index[entry], m->col_index[entry + 1]);
      const StoredRows before = rows_of(m);
      EXPECT_FALSE(reorder_border(*m));
      EXPECT_TRUE(rows_of(m) == before);
      expect_moved(m, "entry " + std::to_string(entry) + " order " + std::to_string(which));
      destroy(m);
    }
  }
}

}  // namespace
}  // namespace sm::test
