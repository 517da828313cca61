#include "cli/structure.hpp"

#include <gtest/gtest.h>

#include "cli/error.hpp"

namespace sm::cli {
namespace {

constexpr std::uint64_t kPlenty = std::uint64_t{1} << 40;

CompressedRows compress(std::int64_t rows, std::int64_t cols, const std::vector<Entry>& entries) {
  EntryStore store;
  store.begin({.rows = rows, .cols = cols});
  store.take(entries);
  return store.compress("a.mtx", kPlenty);
}

TEST(Structure, blocks_are_the_components_of_a_square_matrix) {
  const auto blocks = find_blocks(compress(6, 6, {{0, 4, 1.0}, {4, 2, 1.0}, {1, 1, 1.0}, {3, 5, 1.0}}), kPlenty);
  EXPECT_EQ(blocks.count, 3);  // {0, 2, 4}, {1}, {3, 5}
  EXPECT_EQ(blocks.largest, 3);
}

TEST(Structure, a_chain_entered_in_any_order_is_one_block) {
  std::vector<Entry> entries;
  for (std::int64_t i = 0; i < 1000; ++i) entries.push_back({(i * 7) % 1000, (i * 7 + 1) % 1000, 1.0});
  const auto blocks = find_blocks(compress(1000, 1000, entries), kPlenty);
  EXPECT_EQ(blocks.count, 1);
  EXPECT_EQ(blocks.largest, 1000);
}

TEST(Structure, rows_and_columns_of_a_rectangular_matrix_are_vertices_of_their_own) {
  const auto blocks = find_blocks(compress(2, 3, {{0, 0, 1.0}, {0, 2, 1.0}}), kPlenty);
  EXPECT_EQ(blocks.count, 3);  // row 0 with columns 0 and 2; row 1; column 1
  EXPECT_EQ(blocks.largest, 3);
}

TEST(Structure, a_matrix_without_rows_has_no_blocks) {
  const auto blocks = find_blocks(compress(0, 0, {}), kPlenty);
  EXPECT_EQ(blocks.count, 0);
  EXPECT_EQ(blocks.largest, 0);
}

TEST(Structure, blocks_of_rows_that_only_the_header_knows_of_are_not_counted_past_the_limit) {
  EXPECT_THROW(find_blocks(compress(1000, 1000, {}), 15'999), CommandError);
  EXPECT_EQ(find_blocks(compress(1000, 1000, {}), 16'000).count, 1000);
}

TEST(Structure, the_diagonal_is_described_by_what_is_present_and_what_is_not) {
  const auto diagonal = inspect_diagonal(compress(4, 4, {{0, 0, 5.0}, {2, 2, -3.0}, {1, 3, 9.0}, {0, 1, 100.0}}));
  EXPECT_EQ(diagonal.present, 2);
  EXPECT_EQ(diagonal.smallest, -3.0);
  EXPECT_EQ(diagonal.largest, 5.0);
  EXPECT_EQ(diagonal.missing, (std::vector<std::int64_t>{2, 4}));
}

TEST(Structure, the_memory_estimate_counts_slabs_roots_and_compressed_rows) {
  // 10 rows: slabs of 20 * 20 nodes; 401 nodes are needed with the spare one, so there are two slabs.
  const auto need = estimate_memory(10, 400);
  EXPECT_EQ(need.assembling, 2 * 400 * 32.0 + 20 * 8.0 + 11 * 8.0 + 400 * 16.0);
  EXPECT_EQ(need.ordering, 11 * 8.0 + 400 * 16.0 + 2 * 10 * 8.0 + 8.0 * (4 * 10 + 5 * 400));
}

}  // namespace
}  // namespace sm::cli
