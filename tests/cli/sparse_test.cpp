#include "cli/sparse.hpp"

#include <gtest/gtest.h>

#include <cmath>

#include "cli/error.hpp"

namespace sm::cli {
namespace {

constexpr std::uint64_t kPlenty = std::uint64_t{1} << 40;

CompressedRows compress(std::int64_t rows, std::int64_t cols, const std::vector<Entry>& entries,
                        Layout layout = Layout::coordinate) {
  EntryStore store;
  store.begin({.layout = layout, .rows = rows, .cols = cols});
  store.take(entries);
  return store.compress("a.mtx", kPlenty);
}

// A full matrix, row by row.
std::vector<std::vector<double>> dense(const CompressedRows& m) {
  std::vector<std::vector<double>> full(static_cast<std::size_t>(m.rows),
                                        std::vector<double>(static_cast<std::size_t>(m.cols)));
  for (std::size_t i = 0; i < full.size(); ++i) {
    for (auto p = static_cast<std::size_t>(m.start[i]); p < static_cast<std::size_t>(m.start[i + 1]); ++p) {
      full[i][static_cast<std::size_t>(m.col[p])] = m.value[p];
    }
  }
  return full;
}

double dyadic(std::uint64_t& s) {
  s = s * 6364136223846793005u + 1;
  return (static_cast<double>(s >> 54) - 512.0) / 64.0;
}

std::int64_t below(std::uint64_t& s, std::uint64_t n) {
  s = s * 6364136223846793005u + 1;
  return static_cast<std::int64_t>((s >> 33) % n);
}

TEST(Sparse, rows_are_compressed_with_ascending_columns) {
  const auto m = compress(3, 4, {{2, 3, 5.0}, {0, 2, 2.0}, {2, 0, 4.0}, {0, 0, 1.0}});
  EXPECT_EQ(m.start, (std::vector<std::int64_t>{0, 2, 2, 4}));
  EXPECT_EQ(m.col, (std::vector<std::int64_t>{0, 2, 0, 3}));
  EXPECT_EQ(m.value, (std::vector<double>{1.0, 2.0, 4.0, 5.0}));
}

TEST(Sparse, entries_at_one_position_are_added) {
  const auto m = compress(2, 2, {{0, 1, 1.0}, {1, 1, 8.0}, {0, 1, 2.5}, {0, 0, 1.0}, {0, 1, -0.5}});
  EXPECT_EQ(m.col, (std::vector<std::int64_t>{0, 1, 1}));
  EXPECT_EQ(m.value, (std::vector<double>{1.0, 3.0, 8.0}));
}

TEST(Sparse, a_sum_that_overflows_is_refused_with_its_position) {
  try {
    compress(2, 2, {{1, 0, 1e308}, {1, 0, 1e308}});
    FAIL();
  } catch (const CommandError& error) {
    EXPECT_EQ(error.problem().code, ExitCode::bad_input);
    EXPECT_NE(std::string(error.what()).find("a.mtx: the entries at row 2, column 1 add up to inf"), std::string::npos);
  }
}

TEST(Sparse, zeros_are_entries_of_a_coordinate_file_but_not_of_an_array) {
  const std::vector<Entry> entries{{0, 0, 0.0}, {0, 1, 2.0}};
  EXPECT_EQ(compress(1, 2, entries).size(), 2);
  EXPECT_EQ(compress(1, 2, entries, Layout::array).size(), 1);
}

TEST(Sparse, random_entries_add_up_to_the_dense_matrix) {
  std::uint64_t seed = 7;
  for (int round = 0; round < 20; ++round) {
    const std::int64_t rows = 1 + below(seed, 30);
    const std::int64_t cols = 1 + below(seed, 30);
    std::vector<std::vector<double>> full(static_cast<std::size_t>(rows),
                                          std::vector<double>(static_cast<std::size_t>(cols)));
    std::vector<Entry> entries;
    for (int k = 0; k < 400; ++k) {
      const Entry entry{below(seed, static_cast<std::uint64_t>(rows)), below(seed, static_cast<std::uint64_t>(cols)),
                        dyadic(seed)};
      entries.push_back(entry);
      full[static_cast<std::size_t>(entry.row)][static_cast<std::size_t>(entry.col)] += entry.value;
    }
    const auto m = compress(rows, cols, entries);
    EXPECT_EQ(dense(m), full);
    for (std::int64_t i = 0; i < rows; ++i) {
      for (auto p = static_cast<std::size_t>(m.start[static_cast<std::size_t>(i)]) + 1;
           p < static_cast<std::size_t>(m.start[static_cast<std::size_t>(i) + 1]); ++p) {
        EXPECT_LT(m.col[p - 1], m.col[p]);
      }
    }
  }
}

TEST(Sparse, more_entries_than_a_chunk_keep_their_places) {
  std::vector<Entry> entries;
  for (std::int64_t i = 199'999; i >= 0; --i) entries.push_back({i, i % 3, static_cast<double>(i)});
  const auto m = compress(200'000, 3, entries);
  ASSERT_EQ(m.size(), 200'000);
  for (std::int64_t i = 0; i < m.rows; ++i) {
    const auto p = static_cast<std::size_t>(i);
    EXPECT_TRUE(m.start[p] == i && m.col[p] == i % 3 && m.value[p] == static_cast<double>(i)) << i;
  }
}

TEST(Sparse, rows_that_only_the_header_knows_of_are_not_allocated_past_the_limit) {
  EntryStore store;
  store.begin({.rows = 1'000'000'000'000, .cols = 1});
  try {
    store.compress("a.mtx", std::uint64_t{1} << 32);
    FAIL();
  } catch (const CommandError& error) {
    EXPECT_EQ(error.problem().code, ExitCode::no_memory);
    EXPECT_NE(std::string(error.what()).find("1000000000000 rows"), std::string::npos) << error.what();
  }
}

TEST(Sparse, entries_are_found_where_they_are_and_nowhere_else) {
  const auto m = compress(2, 5, {{0, 1, 1.0}, {0, 3, 2.0}});
  EXPECT_EQ(find_entry(m, 0, 1), 0);
  EXPECT_EQ(find_entry(m, 0, 3), 1);
  for (const std::int64_t col : {0, 2, 4}) EXPECT_FALSE(find_entry(m, 0, col));
  EXPECT_FALSE(find_entry(m, 1, 1));
}

TEST(Sparse, symmetry_is_judged_by_pattern_and_by_value) {
  EXPECT_TRUE(check_symmetry(compress(2, 2, {{0, 1, 3.0}, {1, 0, 3.0}, {1, 1, 1.0}})).values);
  const auto values = check_symmetry(compress(3, 3, {{0, 2, 3.0}, {2, 0, 4.0}, {1, 1, 1.0}}));
  EXPECT_TRUE(values.pattern);
  EXPECT_FALSE(values.values);
  EXPECT_EQ(values.row, 2);
  EXPECT_EQ(values.col, 0);
  EXPECT_EQ(values.below, 4.0);
  EXPECT_EQ(values.above, 3.0);
  const auto pattern = check_symmetry(compress(2, 2, {{1, 0, 0.0}}));
  EXPECT_FALSE(pattern.pattern);
  EXPECT_TRUE(pattern.values);
  const auto absent = check_symmetry(compress(2, 2, {{1, 0, 5.0}}));
  EXPECT_FALSE(absent.values);
  EXPECT_EQ(absent.below, 5.0);
  EXPECT_EQ(absent.above, 0.0);
}

TEST(Sparse, the_upper_triangle_remains) {
  auto m = compress(3, 3, {{0, 0, 1.0}, {1, 0, 2.0}, {0, 1, 2.0}, {2, 1, 3.0}, {1, 2, 3.0}, {2, 2, 4.0}});
  keep_upper_triangle(m);
  EXPECT_EQ(m.start, (std::vector<std::int64_t>{0, 2, 3, 4}));
  EXPECT_EQ(m.col, (std::vector<std::int64_t>{0, 1, 2, 2}));
  EXPECT_EQ(m.value, (std::vector<double>{1.0, 2.0, 3.0, 4.0}));
}

TEST(Sparse, products_and_norms_of_the_upper_triangle_are_those_of_the_whole_matrix) {
  std::uint64_t seed = 3;
  const std::int64_t n = 17;
  std::vector<Entry> entries;
  for (int k = 0; k < 90; ++k) {
    const std::int64_t i = below(seed, 17);
    const std::int64_t j = below(seed, 17);
    entries.push_back({std::min(i, j), std::max(i, j), dyadic(seed)});
  }
  const auto upper = compress(n, n, entries);
  const auto half = dense(upper);
  std::vector<double> x(17);
  for (double& value : x) value = dyadic(seed);
  std::vector<double> y(17);
  multiply_symmetric(upper, x.data(), y.data());
  double norm = 0.0;
  for (std::size_t i = 0; i < 17; ++i) {
    double sum = 0.0;
    double row = 0.0;
    for (std::size_t j = 0; j < 17; ++j) {
      const double a = i <= j ? half[i][j] : half[j][i];
      sum += a * x[j];
      row += std::fabs(a);
    }
    EXPECT_EQ(y[i], sum) << i;
    norm = std::max(norm, row);
  }
  EXPECT_EQ(infinity_norm_symmetric(upper), norm);
}

}  // namespace
}  // namespace sm::cli
