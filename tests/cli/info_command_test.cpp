#include "cli/command.hpp"

namespace sm::test {
namespace {

using InfoCommand = CommandTest;

TEST_F(InfoCommand, describes_a_symmetric_file) {
  const std::string a = matrix("a.mtx", "coordinate real symmetric", "4 4 4\n1 1 4\n3 1 -1\n4 4 -2.5\n3 3 9\n");
  const Outcome run = qxsm({"info", a});
  ASSERT_EQ(run.code, 0) << run.err;
  EXPECT_EQ(run.err, "");
  EXPECT_EQ(run.fact("matrix"), a + " (coordinate real symmetric)");
  EXPECT_EQ(run.fact("order"), "4 x 4");
  EXPECT_EQ(run.fact("stored entries"), "4");
  EXPECT_EQ(run.fact("density"), "31.25 % (5 entries in the whole matrix)");
  EXPECT_EQ(run.fact("symmetry"), "symmetric, as the file says");
  EXPECT_EQ(run.fact("diagonal"), "-2.5 to 9");
  EXPECT_EQ(run.fact("without diagonal"), "1: 2");
  EXPECT_EQ(run.fact("blocks"), "3, the largest of 2 rows");
}

TEST_F(InfoCommand, describes_a_rectangular_file) {
  const std::string a = matrix("a.mtx", "coordinate pattern general", "2 4 3\n1 1\n2 3\n2 4\n");
  const Outcome run = qxsm({"info", a});
  ASSERT_EQ(run.code, 0) << run.err;
  EXPECT_EQ(run.fact("order"), "2 x 4");
  EXPECT_EQ(run.fact("density"), "37.5 % (3 entries in the whole matrix)");
  EXPECT_EQ(run.fact("symmetry"), "not square");
  EXPECT_EQ(run.fact("without diagonal"), "1: 2");
  EXPECT_EQ(run.fact("blocks"), "3, the largest of 3 rows and columns");
  EXPECT_EQ(run.fact("memory needed"), "none, as only symmetric matrices are factored");
}

TEST_F(InfoCommand, tells_pattern_from_value_symmetry) {
  const auto symmetry = [&](const std::string& entries) {
    return qxsm({"info", matrix("a.mtx", "coordinate real general", entries)}).fact("symmetry");
  };
  EXPECT_EQ(symmetry("2 2 3\n1 1 1\n1 2 3\n2 1 3\n"), "symmetric in pattern and value");
  EXPECT_EQ(symmetry("2 2 3\n1 1 1\n1 2 3\n2 1 4\n"), "symmetric in pattern, not in value (4 at (2, 1), 3 at (1, 2))");
  EXPECT_EQ(symmetry("2 2 2\n1 1 1\n1 2 0\n"), "symmetric in value, not in pattern");
  EXPECT_EQ(symmetry("2 2 2\n1 1 1\n1 2 5\n"), "not symmetric (0 at (2, 1), 5 at (1, 2))");
}

TEST_F(InfoCommand, counts_entries_before_and_after_adding_up) {
  const std::string a = matrix("a.mtx", "coordinate real general", "2 2 4\n1 1 1\n1 1 2\n2 2 5\n1 1 -1\n");
  EXPECT_EQ(qxsm({"info", a}).fact("stored entries"), "4 in the file, 2 after adding up those at one position");
}

TEST_F(InfoCommand, shortens_long_lists_in_the_text_only) {
  const std::string a = matrix("a.mtx", "coordinate real symmetric", "25 25 1\n1 1 1\n");
  EXPECT_EQ(qxsm({"info", a}).fact("without diagonal"), "24: 2, 3, 4, 5, 6, 7, 8, 9, 10, 11, ... (14 more)");
  EXPECT_EQ(qxsm({"info", a, "--json"}).json().at("rows_without_diagonal").size(), 24u);
}

TEST_F(InfoCommand, json_has_the_facts_of_the_text) {
  const auto json = qxsm({"info", shipped("494_bus.mtx"), "--json"}).json();
  EXPECT_EQ(json.at("command"), "info");
  EXPECT_EQ(json.at("rows"), 494);
  EXPECT_EQ(json.at("cols"), 494);
  EXPECT_EQ(json.at("stored_entries"), 1080);
  EXPECT_EQ(json.at("entries"), 2 * 1080 - 494);
  EXPECT_EQ(json.at("symmetric_pattern"), true);
  EXPECT_EQ(json.at("symmetric_values"), true);
  EXPECT_EQ(json.at("diagonal_smallest"), 0.1703577);
  EXPECT_EQ(json.at("diagonal_largest"), 20007.71);
  EXPECT_EQ(json.at("blocks"), 1);
  EXPECT_EQ(json.at("largest_block"), 494);
  EXPECT_TRUE(json.at("rows_without_diagonal").empty());
}

TEST_F(InfoCommand, fill_is_that_of_the_factor) {
  const auto info = qxsm({"info", "--fill", shipped("nos3.mtx"), "--json"}).json();
  const auto factor = qxsm({"factor", shipped("nos3.mtx"), "--json"}).json();
  for (const char* key : {"nnz_u", "fill_ratio", "subscripts_stored", "flops", "upper_entries"}) {
    EXPECT_EQ(info.at(key), factor.at(key)) << key;
  }
  EXPECT_EQ(info.at("factoring_bytes"), factor.at("peak_pool_bytes"));
}

TEST_F(InfoCommand, the_estimate_for_assembling_and_ordering_is_what_a_grid_takes) {
  const std::string grid = path("grid.mtx");
  ASSERT_EQ(qxsm({"grid", "300", "300", "-o", grid}).code, 0);
  const auto json = qxsm({"info", "--fill", grid, "--json"}).json();
  // Assembling is the peak of this problem unless the factor is; either way the peak is no less than the estimates.
  const double need = std::max(json.at("assembling_bytes").get<double>(), json.at("ordering_bytes").get<double>());
  EXPECT_GE(json.at("factoring_bytes").get<double>(), need);
  EXPECT_LE(json.at("factoring_bytes").get<double>(), 2.0 * need);
}

TEST_F(InfoCommand, a_matrix_without_rows_is_a_matrix) {
  const Outcome run = qxsm({"info", matrix("empty.mtx", "coordinate real symmetric", "0 0 0\n")});
  ASSERT_EQ(run.code, 0) << run.err;
  EXPECT_EQ(run.fact("order"), "0 x 0");
  EXPECT_EQ(run.fact("diagonal"), "no entries");
}

TEST_F(InfoCommand, fill_needs_a_symmetric_matrix) {
  const std::string wide = matrix("wide.mtx", "coordinate real general", "2 3 1\n1 3 4\n");
  expect_message(qxsm({"info", "--fill", wide}), 2, {wide + ":2: found 2 rows and 3 columns", "; only symmetric"});
}

}  // namespace
}  // namespace sm::test
