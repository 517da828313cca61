#include "cli/fields.hpp"

#include <gtest/gtest.h>

#include <limits>

namespace sm::cli {
namespace {

TEST(Fields, an_index_is_digits_and_nothing_else) {
  std::int64_t value = 0;
  EXPECT_TRUE(parse_index("0", value));
  EXPECT_TRUE(parse_index("9223372036854775807", value));
  EXPECT_EQ(value, std::numeric_limits<std::int64_t>::max());
  for (const char* bad : {"", "-1", "+1", "1.0", "1e3", "x", "9223372036854775808", "0x1", " 1"}) {
    EXPECT_FALSE(parse_index(bad, value)) << bad;
  }
}

TEST(Fields, an_integer_may_have_one_sign) {
  std::int64_t value = 0;
  EXPECT_TRUE(parse_integer("-9223372036854775808", value));
  EXPECT_EQ(value, std::numeric_limits<std::int64_t>::min());
  EXPECT_TRUE(parse_integer("+7", value));
  EXPECT_EQ(value, 7);
  for (const char* bad : {"", "+", "-", "+-7", "--7", "7.0", "9223372036854775808"}) {
    EXPECT_FALSE(parse_integer(bad, value)) << bad;
  }
}

TEST(Fields, a_real_is_read_to_the_nearest_double) {
  double value = 0.0;
  EXPECT_TRUE(parse_real("+.5", value));
  EXPECT_EQ(value, 0.5);
  EXPECT_TRUE(parse_real("-1.25E+2", value));
  EXPECT_EQ(value, -125.0);
  EXPECT_TRUE(parse_real("0.1", value));
  EXPECT_EQ(value, 0.1);
  EXPECT_TRUE(parse_real("1.7976931348623157e308", value));
  EXPECT_EQ(value, std::numeric_limits<double>::max());
}

TEST(Fields, values_below_the_smallest_double_are_zero_or_subnormal) {
  double value = 1.0;
  EXPECT_TRUE(parse_real("1e-999", value));
  EXPECT_EQ(value, 0.0);
  EXPECT_TRUE(parse_real("4.9406564584124654e-324", value));
  EXPECT_EQ(value, std::numeric_limits<double>::denorm_min());
}

TEST(Fields, what_is_no_finite_number_is_no_real) {
  double value = 0.0;
  for (const char* bad : {"", "nan", "NaN", "-nan", "nan(1)", "inf", "-Inf", "infinity", "1e999", "-1e999", "1d3",
                          "+-1", "0x10", "1e", "."}) {
    EXPECT_FALSE(parse_real(bad, value)) << bad;
  }
}

TEST(Fields, a_line_is_split_at_any_run_of_blanks) {
  const auto fields = split_fields("  1\t 22   3.5\r");
  ASSERT_EQ(fields.size(), 3u);
  EXPECT_EQ(fields[0], "1");
  EXPECT_EQ(fields[1], "22");
  EXPECT_EQ(fields[2], "3.5");
  EXPECT_TRUE(split_fields(" \t\r").empty());
  EXPECT_TRUE(split_fields("").empty());
}

}  // namespace
}  // namespace sm::cli
