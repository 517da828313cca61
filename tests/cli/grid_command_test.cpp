#include <cmath>
#include <map>

#include "cli/command.hpp"

namespace sm::test {
namespace {

using GridCommand = CommandTest;

TEST_F(GridCommand, writes_the_five_point_stencil) {
  const Outcome run = qxsm({"grid", "3", "2", "--shift", "0.5"});
  ASSERT_EQ(run.code, 0) << run.err;
  EXPECT_EQ(run.err, "");
  std::map<std::pair<int, int>, double> expected;
  for (int i = 0; i < 6; ++i) expected[{i, i}] = 4.5;
  for (const auto& [below, above] : {std::pair{1, 0}, {2, 1}, {4, 3}, {5, 4}, {3, 0}, {4, 1}, {5, 2}})
    expected[{below, above}] = -1.0;
  std::map<std::pair<int, int>, double> written;
  for (const auto& [row, col, value] : coordinate_entries(run.out)) written[{row, col}] = value;
  EXPECT_EQ(written, expected);
}

TEST_F(GridCommand, what_it_writes_can_be_read_again) {
  const std::string grid = path("grid.mtx");
  const Outcome written = qxsm({"grid", "40", "30", "-o", grid, "--json"});
  ASSERT_EQ(written.code, 0) << written.err;
  EXPECT_EQ(written.json().at("rows"), 1200);
  const auto json = qxsm({"info", grid, "--json"}).json();
  EXPECT_EQ(json.at("rows"), 1200);
  EXPECT_EQ(json.at("stored_entries"), 1200 + 39 * 30 + 40 * 29);
  EXPECT_EQ(json.at("stored_entries"), written.json().at("stored_entries"));
  EXPECT_EQ(json.at("blocks"), 1);
}

// The eigenvalues of the Laplacian with fixed borders are known.
TEST_F(GridCommand, its_log_determinant_is_that_of_the_laplacian) {
  const std::string grid = path("grid.mtx");
  ASSERT_EQ(qxsm({"grid", "23", "31", "--shift", "0.25", "-o", grid}).code, 0);
  double expected = 0.0;
  for (int i = 1; i <= 23; ++i) {
    for (int j = 1; j <= 31; ++j) {
      expected += std::log(4.25 - 2.0 * std::cos(M_PI * i / 24.0) - 2.0 * std::cos(M_PI * j / 32.0));
    }
  }
  const auto json = qxsm({"factor", grid, "--json"}).json();
  EXPECT_EQ(json.at("rank"), 23 * 31);
  EXPECT_NEAR(json.at("log_determinant").get<double>(), expected, 1e-9);
}

TEST_F(GridCommand, a_grid_with_too_many_points_is_refused) {
  expect_message(qxsm({"grid", "9999999999", "9999999999"}), 2, {"too many points", "; give smaller numbers"});
}

}  // namespace
}  // namespace sm::test
