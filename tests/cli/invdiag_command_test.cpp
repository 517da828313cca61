#include <cmath>
#include <filesystem>

#include "cli/command.hpp"
#include "cli/dense.hpp"

namespace sm::test {
namespace {

using InvdiagCommand = CommandTest;

const char* const kChain = "6 6 11\n1 1 1\n2 2 2\n3 3 2\n4 4 2\n5 5 2\n6 6 1\n2 1 -1\n3 2 -1\n4 3 -1\n5 4 -1\n6 5 -1\n";

TEST_F(InvdiagCommand, writes_the_diagonal_of_a_dense_inverse) {
  const std::string d = path("d.mtx");
  const Outcome run = qxsm({"invdiag", shipped("bcsstk01.mtx"), "-o", d});
  ASSERT_EQ(run.code, 0) << run.err;
  EXPECT_EQ(run.fact("rank"), "48 of 48");
  EXPECT_EQ(run.fact("written"), "48 x 1, in " + d);
  EXPECT_NE(read(d).find("\n48 1\n"), std::string::npos);
  const auto values = array_values(read(d));
  const DenseMatrix inverse = dense_inverse(dense_of(read(shipped("bcsstk01.mtx")), 48, 48, true));
  ASSERT_EQ(values.size(), 48u);
  for (std::size_t i = 0; i < 48; ++i) {
    // The condition number is below 1e7.
    EXPECT_NEAR(values[i], static_cast<double>(inverse[i][i]), 1e-9 * values[i]) << i;
  }
}

TEST_F(InvdiagCommand, tells_the_range_and_the_first_values_without_a_file) {
  // Inverse of tridiag(-1, 2, -1) of order 12: element (i, i) is i (13 - i) / 13.
  std::string text = "12 12 23\n";
  for (int i = 1; i <= 12; ++i) text += std::to_string(i) + " " + std::to_string(i) + " 2\n";
  for (int i = 1; i < 12; ++i) text += std::to_string(i + 1) + " " + std::to_string(i) + " -1\n";
  const std::string a = matrix("a.mtx", "coordinate real symmetric", text);
  const Outcome run = qxsm({"invdiag", a});
  ASSERT_EQ(run.code, 0) << run.err;
  for (int i = 1; i <= 10; ++i) {
    EXPECT_NEAR(std::stod(run.fact("row " + std::to_string(i))), i * (13 - i) / 13.0, 1e-14);
  }
  EXPECT_EQ(run.out.find("\nrow 11 "), std::string::npos);
  EXPECT_EQ(run.fact("..."), "2 more");
  EXPECT_EQ(run.fact("written"), "to no file (see -o)");
  const auto json = qxsm({"invdiag", a, "--json"}).json();
  EXPECT_EQ(json.at("command"), "invdiag");
  EXPECT_NEAR(json.at("smallest").get<double>(), 12.0 / 13.0, 1e-14);
  EXPECT_NEAR(json.at("largest").get<double>(), 42.0 / 13.0, 1e-14);
  const auto largest_row = json.at("largest_row").get<int>();
  EXPECT_TRUE(largest_row == 6 || largest_row == 7) << largest_row;
  EXPECT_EQ(json.at("first_values").size(), 10u);
  EXPECT_TRUE(json.at("output").is_null());
}

TEST_F(InvdiagCommand, a_dropped_row_has_a_zero_and_the_others_an_inverse_without_it) {
  const std::string a = matrix("chain.mtx", "coordinate real symmetric", kChain);
  const auto json = qxsm({"invdiag", a, "--json"}).json();
  EXPECT_EQ(json.at("rank"), 5);
  ASSERT_EQ(json.at("rows_dropped").size(), 1u);
  const auto dropped = json.at("rows_dropped")[0].get<std::size_t>() - 1;
  const DenseMatrix inverse = inverse_without(dense_of(read(a), 6, 6, true), dropped);
  const auto values = json.at("first_values").get<std::vector<double>>();
  ASSERT_EQ(values.size(), 6u);
  for (std::size_t i = 0; i < 6; ++i) EXPECT_NEAR(values[i], static_cast<double>(inverse[i][i]), 1e-14) << i;
  EXPECT_EQ(values[dropped], 0.0);
}

TEST_F(InvdiagCommand, a_matrix_that_is_not_semidefinite_ends_with_1_and_leaves_no_file) {
  const std::string a = matrix("a.mtx", "coordinate real symmetric", "2 2 3\n1 1 1\n2 1 2\n2 2 1\n");
  const std::string d = path("d.mtx");
  expect_message(qxsm({"invdiag", a, "-o", d}), 1, {a + ": not positive semidefinite", "; check the entries"});
  EXPECT_FALSE(std::filesystem::exists(d));
}

TEST_F(InvdiagCommand, the_diagonal_can_go_to_standard_output) {
  const std::string a = matrix("a.mtx", "coordinate real general", "2 2 2\n1 1 4\n2 2 0.5\n");
  const Outcome run = qxsm({"invdiag", a, "-o", "-"});
  EXPECT_EQ(run.code, 0);
  EXPECT_EQ(run.out, "%%MatrixMarket matrix array real general\n% diagonal of the inverse of " + a +
                         "\n2 1\n2.5000000000000000e-01\n2.0000000000000000e+00\n");
  EXPECT_NE(run.err.find("2 of 2"), std::string::npos) << run.err;
  expect_message(qxsm({"invdiag", a, "-o", "-", "--json"}), 2, {"standard output", "; send the result to a file"});
}

TEST_F(InvdiagCommand, a_matrix_without_rows_has_no_diagonal) {
  const Outcome run = qxsm({"invdiag", matrix("a.mtx", "coordinate real symmetric", "0 0 0\n")});
  EXPECT_EQ(run.code, 0) << run.err;
  EXPECT_EQ(run.fact("diagonal"), "no elements");
}

}  // namespace
}  // namespace sm::test
