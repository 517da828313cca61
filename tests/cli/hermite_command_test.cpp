#include <filesystem>

#include "cli/command.hpp"
#include "cli/dense.hpp"

namespace sm::test {
namespace {

using HermiteCommand = CommandTest;

TEST_F(HermiteCommand, is_the_inverse_without_the_dropped_row_times_the_matrix) {
  const std::string h = path("h.mtx");
  const Outcome run = qxsm({"hermite", shipped("oneway.mtx"), "-o", h, "--json"});
  ASSERT_EQ(run.code, 0) << run.err;
  const auto json = run.json();
  EXPECT_EQ(json.at("command"), "hermite");
  EXPECT_EQ(json.at("rank"), 3);
  EXPECT_EQ(json.at("trace"), 3.0);
  EXPECT_EQ(json.at("output"), h);
  ASSERT_EQ(json.at("rows_dropped").size(), 1u);
  const DenseMatrix a = dense_file(read(shipped("oneway.mtx")));
  const auto inverse = inverse_without(a, json.at("rows_dropped")[0].get<std::size_t>() - 1);
  expect_near(dense_file(read(h)), dense_product(inverse, a), 1e-14);
  EXPECT_EQ(json.at("hermite_entries").get<std::size_t>(), coordinate_entries(read(h)).size());
}

TEST_F(HermiteCommand, of_a_regular_shipped_matrix_is_the_identity) {
  const std::string h = path("h.mtx");
  const Outcome run = qxsm({"hermite", shipped("bcsstk01.mtx"), "-o", h});
  ASSERT_EQ(run.code, 0) << run.err;
  EXPECT_EQ(run.fact("rank"), "48 of 48");
  EXPECT_EQ(run.fact("rows dropped"), "none");
  EXPECT_EQ(run.fact("written"), "48 x 48, in " + h);
  EXPECT_NEAR(std::stod(run.fact("tr(H)")), 48.0, 1e-9);
  DenseMatrix identity(48, std::vector<long double>(48, 0.0L));
  for (std::size_t i = 0; i < 48; ++i) identity[i][i] = 1.0L;
  // The condition number is below 1e7.
  expect_near(dense_file(read(h)), identity, 1e-9);
}

TEST_F(HermiteCommand, goes_to_standard_output_when_told_to) {
  const Outcome run = qxsm({"hermite", shipped("oneway.mtx"), "-o", "-"});
  EXPECT_EQ(run.code, 0);
  EXPECT_EQ(run.out.rfind("%%MatrixMarket matrix coordinate real general\n", 0), 0u) << run.out;
  EXPECT_NE(run.err.find("3 of 4"), std::string::npos) << run.err;
  EXPECT_EQ(qxsm({"hermite", shipped("oneway.mtx"), "--quiet"}).out, "");
}

TEST_F(HermiteCommand, of_nothing_is_nothing) {
  EXPECT_EQ(qxsm({"hermite", matrix("e.mtx", "coordinate real symmetric", "0 0 0\n")}).fact("Hermite form"),
            "0 entries");
  const Outcome zero = qxsm({"hermite", matrix("z.mtx", "coordinate real symmetric", "3 3 0\n")});
  EXPECT_EQ(zero.fact("rank"), "0 of 3");
  EXPECT_EQ(zero.fact("Hermite form"), "0 entries");
}

TEST_F(HermiteCommand, an_indefinite_matrix_ends_with_1_and_leaves_no_file) {
  const std::string a = matrix("a.mtx", "coordinate real symmetric", "2 2 3\n1 1 1\n2 1 2\n2 2 1\n");
  expect_message(qxsm({"hermite", a, "-o", path("h.mtx")}), 1, {a + ": not positive semidefinite", "; check"});
  EXPECT_FALSE(std::filesystem::exists(path("h.mtx")));
}

// The reciprocal of a pivot that small is infinite.
TEST_F(HermiteCommand, a_form_that_overflows_ends_with_1) {
  const std::string a = matrix("a.mtx", "coordinate real symmetric", "1 1 1\n1 1 1e-320\n");
  const Outcome run = qxsm({"hermite", a, "--json"});
  EXPECT_EQ(run.code, 1) << run.err;
  EXPECT_TRUE(run.json().at("trace").is_null());
}

}  // namespace
}  // namespace sm::test
