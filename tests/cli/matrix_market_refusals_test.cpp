// Every way in which a file can be wrong: the line that is named, what was found, what was expected.
#include <gtest/gtest.h>

#include "cli/reading.hpp"

namespace sm::test {
namespace {

const std::string kReal = "coordinate real general";

void expect_refusal(const std::string& text, std::int64_t line, const std::string& what, const std::string& expected) {
  const cli::Problem problem = refusal(text);
  EXPECT_EQ(problem.line, line) << text;
  EXPECT_NE(problem.what.find(what), std::string::npos) << problem.what;
  EXPECT_NE(problem.expected.find(expected), std::string::npos) << problem.expected;
}

TEST(MatrixMarketRefusals, messages_put_file_line_finding_expectation_and_advice_together) {
  EXPECT_EQ(cli::describe(refusal(file_of(kReal, "2 2 2\n1 1 5\n3 4\n"))),
            "bad.mtx:4: found 2 fields (\"3 4\"), expected 3 (row column value); write one entry to a line");
}

TEST(MatrixMarketRefusals, a_file_must_begin_with_the_banner) {
  expect_refusal("", 1, "found an empty file", "%%MatrixMarket matrix");
  expect_refusal("1 1 1\n", 1, "found \"1 1 1\"", "%%MatrixMarket matrix");
  expect_refusal("%%MatrixMarket matrix coordinate real\n1 1 1\n", 1, "found 4 words", "5:");
  expect_refusal("%%MatrixMarket vector coordinate real general\n1 1\n", 1, "\"vector\"", "matrix");
}

TEST(MatrixMarketRefusals, complex_hermitian_and_skew_symmetric_matrices_are_named) {
  expect_refusal(file_of("coordinate complex general", "1 1 1\n1 1 1 0\n"), 1, "\"complex\"",
                 "real or integer or pattern");
  expect_refusal(file_of("coordinate real hermitian", "1 1 1\n1 1 1\n"), 1, "\"hermitian\"", "general or symmetric");
  expect_refusal(file_of("coordinate real skew-symmetric", "2 2 1\n2 1 1\n"), 1, "\"skew-symmetric\"",
                 "general or symmetric");
  expect_refusal(file_of("elemental real general", "1 1\n"), 1, "\"elemental\"", "coordinate or array");
  expect_refusal(file_of("array pattern general", "1 1\n"), 1, "pattern", "real or integer");
}

TEST(MatrixMarketRefusals, the_size_line_must_be_there_and_whole) {
  expect_refusal(file_of(kReal, "% only a comment\n"), 2, "the file ends before its size line",
                 "rows, columns and entries");
  expect_refusal(file_of(kReal, "3 3\n1 1 1\n"), 2, "found 2 fields", "3 whole numbers");
  expect_refusal(file_of("array real general", "3 3 9\n1\n"), 2, "found 3 fields", "2 whole numbers");
  expect_refusal(file_of(kReal, "3 -3 1\n1 1 1\n"), 2, "\"-3\"", "3 whole numbers");
  expect_refusal(file_of(kReal, "3 3 1.0\n1 1 1\n"), 2, "\"1.0\"", "3 whole numbers");
  expect_refusal(file_of(kReal, "92233720368547758080 1 1\n"), 2, "\"92233720368547758080\"", "3 whole numbers");
}

TEST(MatrixMarketRefusals, sizes_that_cannot_be_are_refused_at_the_size_line) {
  expect_refusal(file_of("coordinate real symmetric", "2 3 1\n1 1 1\n"), 2, "2 rows and 3 columns",
                 "as many rows as columns");
  expect_refusal(file_of("array real general", "4294967296 4294967296\n1\n"), 2, "4294967296 x 4294967296", "2^63");
  expect_refusal(file_of("array real symmetric", "9223372036854775806 9223372036854775806\n1\n"), 2, "array", "2^63");
}

TEST(MatrixMarketRefusals, a_huge_count_allocates_nothing_ahead_of_the_data) {
  expect_refusal(file_of(kReal, "9223372036854775807 1 9223372036854775807\n1 1 1\n"), 3,
                 "the file ends after 1 of 9223372036854775807 entries", "announced in line 2");
  expect_refusal(file_of("array real symmetric", "4294967295 4294967295\n1\n"), 3,
                 "the file ends after 1 of 9223372034707292160 entries", "announced in line 2");
}

TEST(MatrixMarketRefusals, the_number_of_fields_depends_on_layout_and_field) {
  expect_refusal(file_of(kReal, "2 2 1\n1 1\n"), 3, "found 2 fields (\"1 1\")", "3 (row column value)");
  expect_refusal(file_of(kReal, "2 2 1\n1 1 1 1\n"), 3, "found 4 fields", "3 (row column value)");
  expect_refusal(file_of("coordinate pattern general", "2 2 1\n1 1 1\n"), 3, "found 3 fields", "2 (row column)");
  expect_refusal(file_of("array real general", "2 1\n1 2\n"), 3, "found 2 fields", "1 (value)");
  expect_refusal(file_of(kReal, "2 2 1\n7\n"), 3, "found 1 field (\"7\")", "3 (row column value)");
}

TEST(MatrixMarketRefusals, three_fields_of_the_wrong_kind_are_told_apart) {
  expect_refusal(file_of(kReal, "2 2 1\none 1 1\n"), 3, "found row \"one\"", "a row number");
  expect_refusal(file_of(kReal, "2 2 1\n1 1.5 1\n"), 3, "found column \"1.5\"", "a column number");
  expect_refusal(file_of(kReal, "2 2 1\n1 1 many\n"), 3, "found value \"many\"", "a finite number");
  expect_refusal(file_of(kReal, "2 2 1\n1 1 1.5x\n"), 3, "found value \"1.5x\"", "a finite number");
  expect_refusal(file_of("coordinate integer general", "2 2 1\n1 1 4.5\n"), 3, "found value \"4.5\"", "a whole number");
}

TEST(MatrixMarketRefusals, an_index_outside_the_matrix_is_named_with_its_range) {
  expect_refusal(file_of(kReal, "2 3 1\n3 1 1\n"), 3, "found row 3", "1 to 2");
  expect_refusal(file_of(kReal, "2 3 1\n0 1 1\n"), 3, "found row 0", "1 to 2");
  expect_refusal(file_of(kReal, "2 3 1\n1 4 1\n"), 3, "found column 4", "1 to 3");
  expect_refusal(file_of(kReal, "2 3 1\n1 0 1\n"), 3, "found column 0", "1 to 3");
  expect_refusal(file_of(kReal, "2 3 1\n1 -1 1\n"), 3, "found column \"-1\"", "counted from 1");
  expect_refusal(file_of(kReal, "0 0 1\n1 1 1\n"), 3, "found row 1", "no entries");
}

TEST(MatrixMarketRefusals, values_that_are_not_finite_are_refused_in_every_layout) {
  for (const std::string value : {"nan", "NAN", "-nan", "inf", "-Infinity", "1e999"}) {
    const std::string found = "found value \"" + value + "\"";
    expect_refusal(file_of(kReal, "1 1 1\n\n% x\n1 1 " + value + "\n"), 5, found, "a finite number");
    expect_refusal(file_of("array real general", "1 1\n" + value + "\n"), 3, found, "a finite number");
  }
}

TEST(MatrixMarketRefusals, a_truncated_file_says_how_far_it_came) {
  expect_refusal(file_of(kReal, "3 3 4\n1 1 2\n2 2 3\n"), 4, "the file ends after 2 of 4 entries",
                 "4 (announced in line 2)");
  expect_refusal(file_of(kReal, "3 3 4\n1 1 2\n2 2"), 4, "the file ends inside this line, after 1 of 4 entries", "4");
  expect_refusal(file_of("array real general", "2 2\n1\n2\n3\n"), 5, "the file ends after 3 of 4 entries", "4");
}

TEST(MatrixMarketRefusals, a_bad_last_line_without_a_line_feed_may_be_a_truncated_one) {
  const cli::Problem problem = refusal(file_of(kReal, "3 3 1\n1 1"));
  EXPECT_EQ(problem.line, 3);
  EXPECT_NE(problem.what.find("found 2 fields"), std::string::npos);
  EXPECT_NE(problem.advice.find("may be truncated"), std::string::npos);
}

TEST(MatrixMarketRefusals, more_entries_than_announced_are_refused) {
  expect_refusal(file_of(kReal, "3 3 1\n1 1 2\n\n2 2 3\n"), 5, "found a further entry (\"2 2 3\")",
                 "1 (announced in line 2)");
  expect_refusal(file_of("array real general", "1 1\n1\n2\n"), 4, "found a further entry", "1 (announced in line 2)");
}

TEST(MatrixMarketRefusals, a_symmetric_file_with_both_triangles_is_not_added_up) {
  expect_refusal(file_of("coordinate real symmetric", "3 3 4\n1 1 1\n2 1 5\n3 3 1\n1 2 5\n"), 6,
                 "found an entry above the diagonal, and one on the other side in line 4", "one triangle");
  expect_refusal(file_of("coordinate real symmetric", "3 3 2\n1 2 5\n3 1 1\n"), 4,
                 "found an entry below the diagonal, and one on the other side in line 3", "one triangle");
}

TEST(MatrixMarketRefusals, a_line_that_fills_the_buffer_is_no_line_of_numbers) {
  const cli::Problem problem = refusal(file_of(kReal, "1 1 1\n1 1 0." + std::string(200, '1') + "\n"), 100);
  EXPECT_EQ(problem.line, 3);
  EXPECT_NE(problem.what.find("found a line of more than 99 bytes"), std::string::npos);
}

TEST(MatrixMarketRefusals, unprintable_bytes_do_not_reach_the_message) {
  const std::string text = cli::describe(refusal(std::string("\x01\x7f\xff\0words", 9) + std::string(100, 'x')));
  EXPECT_NE(text.find(R"("\x01\x7f\xff\x00words)"), std::string::npos) << text;
  EXPECT_NE(text.find("x...\""), std::string::npos) << text;
}

TEST(MatrixMarketRefusals, damaged_gzip_data_say_how_far_they_could_be_read) {
  const std::string text = file_of(kReal, "2 2 2\n1 1 1\n2 2 1\n");
  const std::string packed = gzip(text);
  cli::Problem problem = refusal(packed.substr(0, packed.size() - 4));
  EXPECT_NE(problem.what.find("the gzip data end early after 2 of 2 entries"), std::string::npos) << problem.what;
  std::string damaged = packed;
  damaged[packed.size() - 6] = static_cast<char>(damaged[packed.size() - 6] ^ 0x55);
  problem = refusal(damaged);
  EXPECT_NE(problem.what.find("the gzip data are damaged"), std::string::npos) << problem.what;
  EXPECT_NE(problem.what.find("after 2 of 2 entries"), std::string::npos) << problem.what;
}

TEST(MatrixMarketRefusals, gzip_data_that_end_inside_an_entry_are_not_blamed_on_the_entry) {
  std::string text = "5000 1 5000\n";
  for (int i = 1; i <= 5000; ++i) text += std::to_string(i) + " 1 " + std::to_string(i * 7919 % 5000) + "\n";
  const std::string packed = gzip(file_of(kReal, text));
  const cli::Problem problem = refusal(packed.substr(0, packed.size() / 2));
  EXPECT_NE(problem.what.find("the gzip data end early after "), std::string::npos) << problem.what;
  EXPECT_GT(problem.line, 100);
}

}  // namespace
}  // namespace sm::test
