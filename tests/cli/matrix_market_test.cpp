#include "cli/matrix_market.hpp"

#include <gtest/gtest.h>

#include "cli/reading.hpp"

namespace sm::test {
namespace {

using cli::Field;
using cli::Layout;
using cli::Symmetry;
using Entries = std::vector<Triple>;

TEST(MatrixMarket, a_general_coordinate_file_is_read_in_its_order) {
  const auto read = read_text(file_of("coordinate real general", "% note\n3 4 3\n3 4 2.5\n1 1 -1e2\n2 3 +.25\n"));
  EXPECT_EQ(read.header().rows, 3);
  EXPECT_EQ(read.header().cols, 4);
  EXPECT_EQ(read.header().entries, 3);
  EXPECT_EQ(read.header().size_line, 3);
  EXPECT_EQ(read.header().layout, Layout::coordinate);
  EXPECT_EQ(read.header().field, Field::real);
  EXPECT_EQ(read.header().symmetry, Symmetry::general);
  EXPECT_EQ(read.entries(), (Entries{{2, 3, 2.5}, {0, 0, -100.0}, {1, 2, 0.25}}));
}

TEST(MatrixMarket, entries_below_the_diagonal_of_a_symmetric_file_are_mirrored) {
  const auto read = read_text(file_of("coordinate real symmetric", "3 3 3\n1 1 4\n3 1 -1\n3 3 2\n"));
  EXPECT_EQ(read.entries(), (Entries{{0, 0, 4.0}, {0, 2, -1.0}, {2, 2, 2.0}}));
}

TEST(MatrixMarket, a_symmetric_file_may_hold_the_upper_triangle_instead) {
  const auto read = read_text(file_of("coordinate real symmetric", "3 3 2\n1 3 -1\n3 3 2\n"));
  EXPECT_EQ(read.entries(), (Entries{{0, 2, -1.0}, {2, 2, 2.0}}));
}

TEST(MatrixMarket, integers_and_patterns_become_doubles) {
  EXPECT_EQ(read_text(file_of("coordinate integer general", "1 2 2\n1 1 -7\n1 2 +8\n")).entries(),
            (Entries{{0, 0, -7.0}, {0, 1, 8.0}}));
  EXPECT_EQ(read_text(file_of("coordinate pattern general", "2 2 2\n1 2\n2 1\n")).entries(),
            (Entries{{0, 1, 1.0}, {1, 0, 1.0}}));
}

TEST(MatrixMarket, an_array_runs_down_its_columns) {
  EXPECT_EQ(read_text(file_of("array real general", "2 3\n1\n2\n3\n0\n5\n6\n")).entries(),
            (Entries{{0, 0, 1}, {1, 0, 2}, {0, 1, 3}, {1, 1, 0}, {0, 2, 5}, {1, 2, 6}}));
}

TEST(MatrixMarket, a_symmetric_array_holds_the_lower_triangle_by_columns) {
  const auto read = read_text(file_of("array integer symmetric", "3 3\n11\n21\n31\n22\n32\n33\n"));
  EXPECT_EQ(read.header().entries, 6);
  EXPECT_EQ(read.entries(), (Entries{{0, 0, 11}, {0, 1, 21}, {0, 2, 31}, {1, 1, 22}, {1, 2, 32}, {2, 2, 33}}));
}

TEST(MatrixMarket, the_words_of_the_banner_may_have_any_case) {
  EXPECT_EQ(read_text("%%matrixmarket MATRIX Coordinate REAL General\n1 1 1\n1 1 2\n").entries(),
            (Entries{{0, 0, 2.0}}));
}

TEST(MatrixMarket, carriage_returns_blank_lines_and_comments_are_passed_over) {
  const auto read = read_text(
      "%%MatrixMarket matrix coordinate real general\r\n\r\n  % indented\r\n2 2 2\r\n\r\n1 1 2\r\n% inside\r\n\t\r\n2 "
      "2 "
      "3 \r\n\r\n% after\r\n");
  EXPECT_EQ(read.header().size_line, 4);
  EXPECT_EQ(read.entries(), (Entries{{0, 0, 2.0}, {1, 1, 3.0}}));
}

TEST(MatrixMarket, the_last_line_needs_no_line_feed) {
  EXPECT_EQ(read_text(file_of("coordinate real general", "1 1 1\n1 1 2.5")).entries(), (Entries{{0, 0, 2.5}}));
}

TEST(MatrixMarket, repeated_entries_are_reported_one_by_one) {
  EXPECT_EQ(read_text(file_of("coordinate real general", "1 1 2\n1 1 2\n1 1 3\n")).entries(),
            (Entries{{0, 0, 2.0}, {0, 0, 3.0}}));
}

TEST(MatrixMarket, matrices_without_rows_or_entries_are_read) {
  EXPECT_TRUE(read_text(file_of("coordinate real symmetric", "0 0 0\n")).entries().empty());
  EXPECT_TRUE(read_text(file_of("coordinate real general", "5 5 0\n")).entries().empty());
  EXPECT_TRUE(read_text(file_of("array real general", "0 7\n")).entries().empty());
}

TEST(MatrixMarket, a_huge_order_takes_no_memory_by_itself) {
  const auto read = read_text(
      file_of("coordinate real general", "9223372036854775807 9223372036854775807 1\n9223372036854775807 1 2\n"));
  EXPECT_EQ(read.entries(), (Entries{{9223372036854775806, 0, 2.0}}));
}

TEST(MatrixMarket, many_entries_pass_in_batches_without_loss) {
  std::string text = "5000 1 5000\n";
  for (int i = 5000; i > 0; --i) text += std::to_string(i) + " 1 " + std::to_string(i) + "\n";
  const auto read = read_text(file_of("coordinate real general", text));
  ASSERT_EQ(read.entries().size(), 5000u);
  for (std::int64_t i = 0; i < 5000; ++i) {
    EXPECT_EQ(read.entries()[static_cast<std::size_t>(i)], Triple(4999 - i, 0, static_cast<double>(5000 - i)));
  }
}

TEST(MatrixMarket, the_pieces_in_which_the_bytes_come_do_not_matter) {
  const std::string text = file_of("coordinate real general", "20 1 3\n1 1 1.5\n11 1 2.25\n20 1 -3e-5\n");
  const auto whole = read_text(text).entries();
  for (std::size_t piece = 1; piece < 20; ++piece) EXPECT_EQ(read_text(text, piece).entries(), whole) << piece;
}

}  // namespace
}  // namespace sm::test
