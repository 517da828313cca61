#include <cmath>

#include "cli/command.hpp"

namespace sm::test {
namespace {

class FactorCommand : public CommandTest {
 protected:
  PrintedJson factor(const std::string& kind, const std::string& rest, int code = 0) const {
    const Outcome run = qxsm({"factor", matrix("a.mtx", kind, rest), "--json"});
    EXPECT_EQ(run.code, code) << run.err;
    return run.json();
  }
  // A full lower triangle of order n with the given diagonal and -1 below it.
  static std::string full(int n, double diagonal) {
    std::string text = std::to_string(n) + " " + std::to_string(n) + "\n";
    for (int j = 0; j < n; ++j) {
      for (int i = j; i < n; ++i) text += (i == j ? std::to_string(diagonal) : "-1") + "\n";
    }
    return text;
  }
};

TEST_F(FactorCommand, finds_rank_and_determinant_of_a_definite_matrix) {
  const auto json = factor("coordinate real symmetric", "3 3 5\n1 1 4\n2 1 -1\n2 2 4\n3 2 -1\n3 3 4\n");
  EXPECT_EQ(json.at("rank"), 3);
  EXPECT_NEAR(json.at("log_determinant").get<double>(), std::log(56.0), 1e-14);  // 4 (16 - 1) - 4
  EXPECT_EQ(json.at("definiteness"), "positive definite");
  EXPECT_TRUE(json.at("rows_dropped").empty());
}

TEST_F(FactorCommand, drops_the_dependent_row_of_a_singular_matrix) {
  // Rows 2 and 4 are the same; the rest is an identity.
  const auto json = factor("coordinate real symmetric", "4 4 5\n1 1 1\n2 2 1\n3 3 1\n4 4 1\n4 2 1\n");
  EXPECT_EQ(json.at("rank"), 3);
  EXPECT_EQ(json.at("log_determinant"), 0.0);
  EXPECT_EQ(json.at("definiteness"), "positive semidefinite, singular");
  ASSERT_EQ(json.at("rows_dropped").size(), 1u);
  const int dropped = json.at("rows_dropped")[0].get<int>();
  EXPECT_TRUE(dropped == 2 || dropped == 4) << dropped;
}

TEST_F(FactorCommand, counts_rows_from_1_and_shortens_them_in_the_text_only) {
  const std::string a = matrix("a.mtx", "coordinate real symmetric", "15 15 2\n1 1 2\n15 15 2\n");
  const Outcome text = qxsm({"factor", a});
  EXPECT_EQ(text.fact("rank"), "2 of 15");
  EXPECT_EQ(text.fact("rows dropped"), "2, 3, 4, 5, 6, 7, 8, 9, 10, 11, ... (3 more)");
  const std::vector<int> all = {2, 3, 4, 5, 6, 7, 8, 9, 10, 11, 12, 13, 14};
  EXPECT_EQ(qxsm({"factor", a, "--json"}).json().at("rows_dropped").get<std::vector<int>>(), all);
}

TEST_F(FactorCommand, answers_no_to_an_indefinite_matrix) {
  const std::string a = matrix("a.mtx", "coordinate real symmetric", "2 2 3\n1 1 1\n2 1 2\n2 2 1\n");
  const Outcome run = qxsm({"factor", a});
  expect_message(run, 1, {a + ": not positive semidefinite", "; check the entries off the diagonal"});
  EXPECT_EQ(run.fact("definiteness"), "not positive semidefinite");
  const Outcome json = qxsm({"factor", a, "--json"});
  EXPECT_EQ(json.code, 1);
  EXPECT_EQ(json.json().at("definiteness"), "not positive semidefinite");
  EXPECT_EQ(json.json().at("error").at("exit_code"), 1);
  EXPECT_EQ(json.json().at("rows"), 2);
}

TEST_F(FactorCommand, points_at_a_negative_diagonal) {
  const std::string a = matrix("a.mtx", "coordinate real symmetric", "2 2 2\n1 1 1\n2 2 -7.5\n");
  expect_message(qxsm({"factor", a}), 1,
                 {"not positive semidefinite", "; the diagonal goes down to -7.5: check the signs"});
}

TEST_F(FactorCommand, counts_what_a_full_factor_costs) {
  // Rows of U have 4, 3, 2, 1 and 0 entries off the diagonal; with compressed subscripts they share the first row's.
  const auto json = factor("array real symmetric", full(5, 9.0));
  EXPECT_EQ(json.at("upper_entries"), 15);
  EXPECT_EQ(json.at("nnz_u"), 10);
  EXPECT_EQ(json.at("subscripts_stored"), 4);
  EXPECT_EQ(json.at("fill_ratio"), 1.0);
  EXPECT_EQ(json.at("flops"), 4 * 6 + 3 * 5 + 2 * 4 + 1 * 3);
}

TEST_F(FactorCommand, a_diagonal_matrix_has_no_entries_off_the_diagonal) {
  const auto json = factor("coordinate integer general", "3 3 3\n1 1 2\n2 2 4\n3 3 8\n");
  EXPECT_EQ(json.at("nnz_u"), 0);
  EXPECT_EQ(json.at("subscripts_stored"), 0);
  EXPECT_EQ(json.at("flops"), 0.0);
  EXPECT_NEAR(json.at("log_determinant").get<double>(), std::log(64.0), 1e-14);
}

TEST_F(FactorCommand, adds_up_repeated_entries_and_leaves_zeros_out) {
  const auto json = factor("coordinate real symmetric", "3 3 6\n1 1 1\n1 1 2\n2 2 3\n3 3 3\n2 1 0\n3 1 1\n");
  EXPECT_EQ(json.at("stored_entries"), 6);
  EXPECT_EQ(json.at("upper_entries"), 4);
  EXPECT_NEAR(json.at("log_determinant").get<double>(), std::log(3.0 * 3.0 * 3.0 - 3.0), 1e-14);
}

TEST_F(FactorCommand, reads_the_same_matrix_from_every_kind_of_file) {
  const double expected = std::log(11.0);  // [3 1; 1 4]
  for (const auto& [kind, rest] : std::vector<std::pair<const char*, const char*>>{
           {"coordinate real symmetric", "2 2 3\n1 1 3\n2 1 1\n2 2 4\n"},
           {"coordinate real symmetric", "2 2 3\n1 1 3\n1 2 1\n2 2 4\n"},
           {"coordinate integer general", "2 2 4\n1 1 3\n2 1 1\n1 2 1\n2 2 4\n"},
           {"array real general", "2 2\n3\n1\n1\n4\n"},
           {"array integer symmetric", "2 2\r\n3\r\n1\r\n4\r\n"}}) {
    EXPECT_NEAR(factor(kind, rest).at("log_determinant").get<double>(), expected, 1e-14) << kind;
  }
}

TEST_F(FactorCommand, serves_matrices_of_order_0_and_1) {
  const auto none = factor("coordinate real symmetric", "0 0 0\n");
  EXPECT_EQ(none.at("rank"), 0);
  EXPECT_EQ(none.at("log_determinant"), 0.0);
  const auto one = factor("coordinate real symmetric", "1 1 1\n1 1 2\n");
  EXPECT_EQ(one.at("rank"), 1);
  EXPECT_NEAR(one.at("log_determinant").get<double>(), std::log(2.0), 1e-15);
}

TEST_F(FactorCommand, times_its_phases_and_measures_memory) {
  const Outcome run = qxsm({"factor", shipped("bcsstk13.mtx"), "--json"});
  ASSERT_EQ(run.code, 0) << run.err;
  const auto json = run.json();
  std::vector<std::string> names;
  for (const auto& phase : json.at("phases")) {
    names.push_back(phase.at("name").get<std::string>());
    EXPECT_GE(phase.at("seconds").get<double>(), 0.0);
    EXPECT_EQ(phase.contains("gflops"), phase.at("name") == "numeric");
  }
  EXPECT_EQ(names, (std::vector<std::string>{"reading", "assembling", "closing", "ordering", "reordering", "symbolic",
                                             "numeric"}));
  const auto& numeric = json.at("phases").back();
  EXPECT_NEAR(numeric.at("gflops").get<double>() * numeric.at("seconds").get<double>() * 1e9,
              json.at("flops").get<double>(), 1.0);
  // The values of U alone take this much.
  EXPECT_GT(json.at("peak_pool_bytes").get<double>(), 8.0 * json.at("nnz_u").get<double>());
  EXPECT_GT(json.at("peak_resident_bytes").get<double>(), 8.0 * json.at("nnz_u").get<double>());
}

TEST_F(FactorCommand, json_and_text_agree) {
  const Outcome text = qxsm({"factor", shipped("gr_30_30.mtx")});
  const auto json = qxsm({"factor", shipped("gr_30_30.mtx"), "--json"}).json();
  EXPECT_EQ(text.fact("rank"), std::to_string(json.at("rank").get<int>()) + " of 900");
  EXPECT_EQ(std::stod(text.fact("log-determinant")), json.at("log_determinant").get<double>());
  EXPECT_EQ(text.fact("definiteness"), json.at("definiteness").get<std::string>());
  EXPECT_EQ(std::stoll(text.fact("nnz(U)")), json.at("nnz_u").get<long long>());
  EXPECT_EQ(std::stoll(text.fact("subscripts")), json.at("subscripts_stored").get<long long>());
  EXPECT_EQ(std::stod(text.fact("flops")), json.at("flops").get<double>());
  EXPECT_NEAR(std::stod(text.fact("fill ratio")), json.at("fill_ratio").get<double>(), 5e-4);
}

TEST_F(FactorCommand, says_nothing_when_quiet_and_successful) {
  const Outcome run = qxsm({"factor", shipped("bcsstk01.mtx"), "--quiet"});
  EXPECT_EQ(run.code, 0);
  EXPECT_EQ(run.out, "");
  EXPECT_EQ(run.err, "");
}

}  // namespace
}  // namespace sm::test
