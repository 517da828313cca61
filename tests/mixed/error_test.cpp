#include "mixed/error.hpp"

#include <gtest/gtest.h>

namespace sm::mixed::test {
namespace {

TEST(Fault, names_file_line_column_variable_cause_and_remedy) {
  EXPECT_EQ(describe({.file = "milk.csv",
                      .line = 17,
                      .column = 9,
                      .variable = "yield",
                      .what = "found \"12,5\"",
                      .expected = "a number",
                      .advice = "write a decimal point"}),
            "milk.csv:17:9: 'yield': found \"12,5\", expected a number; write a decimal point");
}

TEST(Fault, leaves_out_what_it_does_not_know) {
  EXPECT_EQ(describe({.what = "no observation is left"}), "no observation is left");
  EXPECT_EQ(describe({.column = 5, .what = "found ')'"}), "column 5: found ')'");
  EXPECT_EQ(describe({.file = "a.csv", .variable = "g", .what = "has one level"}), "a.csv: 'g': has one level");
}

TEST(Fault, shows_control_characters_instead_of_sending_them) {
  EXPECT_EQ(describe({.file = "a\x1b[2Jb.csv", .variable = "x\ny", .what = "w\t", .advice = "\x7f"}),
            "a\\x1b[2Jb.csv: 'x\\x0ay': w\\x09; \\x7f");
  EXPECT_EQ(describe({.what = "1\xc2\x9b"
                              "31m, 5\xc2\xa0m"}),
            "1\\xc2\\x9b31m, 5\xc2\xa0m");
  EXPECT_EQ(describe({.what = "naïve", .excerpt = "  y ~\n   ^"}), "naïve\n  y ~\n   ^");
}

}  // namespace
}  // namespace sm::mixed::test
