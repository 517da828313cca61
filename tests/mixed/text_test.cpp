#include "mixed/text.hpp"

#include <gtest/gtest.h>

#include <cmath>
#include <limits>

#include "mixed/example_fit.hpp"

namespace sm::mixed::test {
namespace {

TEST(Text, counts_the_columns_that_characters_take) {
  EXPECT_EQ(cells("abc"), 3U);
  EXPECT_EQ(cells("Größe µ"), 7U);
  EXPECT_EQ(cells("\xE6\xB8\xA9\xE5\xBA\xA6"), 4U);
  EXPECT_EQ(cells("e\xCC\x81"), 1U);
  EXPECT_EQ(cells("\xff\xc3"), 2U);
  EXPECT_EQ(pad_left("—", 3), "  —");
  EXPECT_EQ(pad_right("ö", 3), "ö  ");
  EXPECT_EQ(pad_right("long", 3), "long");
}

TEST(Text, decodes_utf8_and_refuses_what_only_looks_like_it) {
  const auto first = [](std::string_view text) { return next_character(text); };
  EXPECT_EQ(first("\xE2\x80\x94"), U'\u2014');
  EXPECT_EQ(first("\xF0\x9F\x8C\xB1"), U'\U0001F331');
  EXPECT_EQ(first("\xC0\xAF"), 0xFFFDU);          // overlong
  EXPECT_EQ(first("\xE0\x80\xAF"), 0xFFFDU);      // overlong
  EXPECT_EQ(first("\xED\xA0\x80"), 0xFFFDU);      // half of a surrogate pair
  EXPECT_EQ(first("\xF4\x90\x80\x80"), 0xFFFDU);  // beyond Unicode
  EXPECT_EQ(first("\xE2\x80"), 0xFFFDU);          // cut short
}

TEST(Text, cuts_names_between_characters) {
  EXPECT_EQ(cut("Variety", 7), "Variety");
  EXPECT_EQ(cut("VarietyMarvellous", 7), "Variet…");
  EXPECT_EQ(cut("\xE6\xB8\xA9\xE5\xBA\xA6", 3), "\xE6\xB8\xA9…");
  EXPECT_EQ(cut("abc", 0), "");
}

TEST(Text, shows_what_cannot_be_printed) {
  EXPECT_EQ(printable("a\nb\tc\x07\x7f"), "a\\nb\\tc\\x07\\x7f");
  EXPECT_EQ(printable("not \xff\xc3"), "not \\xff\\xc3");
  EXPECT_EQ(printable("Größe \xEF\xBF\xBD"), "Größe \xEF\xBF\xBD");
  EXPECT_EQ(printable("\xC2\x85"), "\\x85");
}

TEST(Text, wraps_lines_at_spaces) {
  EXPECT_EQ(wrapped("one two three", 8, 2), "one two\n  three\n");
  EXPECT_EQ(wrapped("unbreakable", 4, 2), "unbreakable\n");
  EXPECT_EQ(wrapped("a unbreakable b", 6, 1), "a\n unbreakable\n b\n");
  EXPECT_EQ(wrapped("", 8, 2), "\n");
}

using Strings = std::vector<std::string>;

TEST(NumberColumn, gives_all_numbers_the_decimals_of_the_smallest) {
  const double values[] = {612.08994, 35.0716605, 0.0};
  EXPECT_EQ(number_column(values, 6), (Strings{"612.0899", "35.0717", "0"}));
}

TEST(NumberColumn, follows_the_scales_where_there_are_some) {
  const double values[] = {251.40510485, 1e-9, -1e-9};
  const double scales[] = {6.8245565, 1.5457889, 1.5457889};
  EXPECT_EQ(number_column(values, 5, scales), (Strings{"251.4051", "0.0000", "0.0000"}));
}

TEST(NumberColumn, writes_what_spans_too_much_each_by_itself) {
  const double values[] = {1.5e12, 2.25e-7, -3.0};
  EXPECT_EQ(number_column(values, 4), (Strings{"1.5e+12", "2.25e-07", "-3"}));
}

TEST(NumberColumn, has_a_dash_for_no_number) {
  const double values[] = {std::nan(""), 2.0, std::numeric_limits<double>::infinity()};
  EXPECT_EQ(number_column(values, 2), (Strings{"—", "2.0", "—"}));
}

TEST(TextTable, aligns_names_to_the_left_and_numbers_to_the_right) {
  TextTable table{.head = {"", "n"}, .rows = {{"ö", "10"}, {"ab", "—"}}, .names = 1, .indent = 1};
  EXPECT_EQ(table.text(), "      n\n ö   10\n ab   —\n");
}

TEST(TextTable, gives_a_long_name_a_line_of_its_own) {
  TextTable table{
      .head = {"g", "t", "n"}, .rows = {{"a", "b", "1"}, {"long", "b", "2"}, {"a", "lengthy", "3"}}, .names = 2};
  table.widest_name = 3;
  EXPECT_EQ(table.text(),
            "g  t  n\n"
            "a  b  1\n"
            "long\n"
            "   b  2\n"
            "a  lengthy\n"
            "      3\n");
}

}  // namespace
}  // namespace sm::mixed::test
