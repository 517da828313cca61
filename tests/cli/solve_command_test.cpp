#include <cmath>
#include <filesystem>

#include "cli/command.hpp"

namespace sm::test {
namespace {

using Vectors = std::vector<std::vector<long double>>;

class SolveCommand : public CommandTest {
 protected:
  // The Laplacian of a chain without fixed ends: singular, with the constant vectors as its null space.
  std::string chain() const {
    std::string text = "6 6 11\n";
    for (int i = 1; i <= 6; ++i)
      text += std::to_string(i) + " " + std::to_string(i) + (i == 1 || i == 6 ? " 1\n" : " 2\n");
    for (int i = 1; i < 6; ++i) text += std::to_string(i + 1) + " " + std::to_string(i) + " -1\n";
    return matrix("chain.mtx", "coordinate real symmetric", text);
  }

  // The largest |b - A x| over all columns, in long double, from the files themselves; A symmetric, by one triangle.
  static double residual(const std::string& a, const std::vector<double>& x, const std::vector<double>& b,
                         std::size_t n) {
    double largest = 0.0;
    const auto entries = coordinate_entries(read(a));
    for (std::size_t offset = 0; offset < b.size(); offset += n) {
      std::vector<long double> r(b.begin() + static_cast<std::ptrdiff_t>(offset),
                                 b.begin() + static_cast<std::ptrdiff_t>(offset + n));
      for (const auto& [row, col, value] : entries) {
        const auto i = static_cast<std::size_t>(row);
        const auto j = static_cast<std::size_t>(col);
        r[i] -= static_cast<long double>(value) * x[offset + j];
        if (i != j) r[j] -= static_cast<long double>(value) * x[offset + i];
      }
      for (const long double element : r) {
        EXPECT_TRUE(std::isfinite(element));
        largest = std::max(largest, static_cast<double>(std::fabs(element)));
      }
    }
    return largest;
  }
};

TEST_F(SolveCommand, solves_every_shipped_matrix_to_rounding) {
  for (const char* name : {"bcsstk01.mtx", "494_bus.mtx", "gr_30_30.mtx", "nos3.mtx", "bcsstk13.mtx"}) {
    const Outcome run = qxsm({"solve", shipped(name), "--json"});
    ASSERT_EQ(run.code, 0) << run.err;
    const auto json = run.json();
    EXPECT_EQ(json.at("rank"), json.at("rows")) << name;
    EXPECT_EQ(json.at("right_hand_sides").size(), 1u);
    // Rounding level: a few units for each of the operations that meet in one element.
    EXPECT_LT(json.at("largest_residual").get<double>(), 1e-14) << name;
    EXPECT_TRUE(json.at("right_hand_sides")[0].at("consistent").get<bool>());
  }
}

TEST_F(SolveCommand, writes_an_exact_solution_with_17_digits) {
  const std::string a = matrix("a.mtx", "coordinate real symmetric", "2 2 3\n1 1 2\n2 1 1\n2 2 4\n");
  const std::string b = matrix("b.mtx", "array real general", "2 1\n4\n9\n");
  const std::string x = path("x.mtx");
  const Outcome run = qxsm({"solve", a, "-b", b, "-o", x});
  ASSERT_EQ(run.code, 0) << run.err;
  EXPECT_EQ(run.fact("solution"), "2 x 1, in " + x);
  EXPECT_EQ(run.fact("right-hand sides"), "1, from " + b);
  EXPECT_EQ(run.fact("relative residual"), "0.000e+00");
  EXPECT_EQ(read(x), "%%MatrixMarket matrix array real general\n% solution of A x = b, A in " + a +
                         "\n2 1\n1.0000000000000000e+00\n2.0000000000000000e+00\n");
}

TEST_F(SolveCommand, the_default_right_hand_side_has_the_solution_1) {
  const std::string x = path("x.mtx");
  ASSERT_EQ(qxsm({"solve", shipped("gr_30_30.mtx"), "-o", x, "--quiet"}).code, 0);
  const auto values = array_values(read(x));
  ASSERT_EQ(values.size(), 900u);
  for (const double value : values) EXPECT_NEAR(value, 1.0, 1e-11);
}

TEST_F(SolveCommand, solves_for_many_right_hand_sides_at_once) {
  // More than one call of the solver takes, more than the text lists.
  const std::size_t n = 960;
  std::vector<double> b;
  std::string text = "960 37\n";
  std::uint64_t seed = 11;
  for (std::size_t i = 0; i < n * 37; ++i) {
    seed = seed * 6364136223846793005u + 1;
    b.push_back((static_cast<double>(seed >> 54) - 512.0) / 64.0);
    text += std::to_string(b.back()) + "\n";
  }
  const std::string x = path("x.mtx");
  const Outcome run = qxsm({"solve", shipped("nos3.mtx"), "-b", matrix("b.mtx", "array real general", text), "-o", x});
  ASSERT_EQ(run.code, 0) << run.err;
  const auto values = array_values(read(x));
  ASSERT_EQ(values.size(), n * 37);
  double largest = 0.0;
  for (const double value : values) largest = std::max(largest, std::fabs(value));
  // A has a norm of about 800.
  EXPECT_LT(residual(shipped("nos3.mtx"), values, b, n), 1e-12 * largest);
  run.fact("relative residual 10");
  EXPECT_EQ(run.out.find("relative residual 11"), std::string::npos);
  EXPECT_EQ(run.fact("..."), "27 more");
}

TEST_F(SolveCommand, right_hand_sides_may_be_coordinates) {
  const std::string a = matrix("a.mtx", "coordinate real symmetric", "2 2 2\n1 1 2\n2 2 4\n");
  const std::string b = matrix("b.mtx", "coordinate integer general", "2 3 2\n1 2 6\n2 3 8\n");
  const std::string x = path("x.mtx");
  ASSERT_EQ(qxsm({"solve", a, "-b", b, "-o", x}).code, 0);
  EXPECT_EQ(array_values(read(x)), (std::vector<double>{0, 0, 3, 0, 0, 2}));
}

TEST_F(SolveCommand, a_consistent_right_hand_side_of_a_singular_matrix_is_solved) {
  const std::string a = chain();
  const std::string b = matrix("b.mtx", "array real general", "6 1\n1\n0\n0\n0\n0\n-1\n");
  const std::string x = path("x.mtx");
  const Outcome run = qxsm({"solve", a, "-b", b, "-o", x});
  ASSERT_EQ(run.code, 0) << run.err;
  EXPECT_EQ(run.fact("rank"), "5 of 6");
  EXPECT_NE(run.fact("relative residual").find(", consistent"), std::string::npos);
  EXPECT_LT(residual(a, array_values(read(x)), {1, 0, 0, 0, 0, -1}, 6), 1e-14);
}

TEST_F(SolveCommand, an_inconsistent_right_hand_side_is_named_and_ends_with_1) {
  const std::string b = matrix("b.mtx", "array real general", "6 2\n1\n0\n0\n0\n0\n-1\n1\n0\n0\n0\n0\n0\n");
  const std::string x = path("x.mtx");
  const Outcome run = qxsm({"solve", chain(), "-b", b, "-o", x});
  expect_message(
      run, 1,
      {b + ": A x = b has no solution for the right-hand sides 2 (A is singular", "above 1e-10)", "; the x found"});
  EXPECT_NE(run.fact("relative residual 1").find(", consistent"), std::string::npos);
  EXPECT_NE(run.fact("relative residual 2").find(", inconsistent"), std::string::npos);
  EXPECT_EQ(array_values(read(x)).size(), 12u);
}

TEST_F(SolveCommand, json_tells_the_right_hand_sides_apart) {
  const std::string b = matrix("b.mtx", "array real general", "6 2\n1\n0\n0\n0\n0\n-1\n1\n0\n0\n0\n0\n0\n");
  const Outcome run = qxsm({"solve", chain(), "-b", b, "--json"});
  EXPECT_EQ(run.code, 1);
  const auto json = run.json();
  EXPECT_EQ(json.at("right_hand_sides")[0].at("consistent"), true);
  EXPECT_EQ(json.at("right_hand_sides")[1].at("consistent"), false);
  EXPECT_LT(json.at("right_hand_sides")[0].at("relative_residual").get<double>(), 1e-14);
  EXPECT_GT(json.at("right_hand_sides")[1].at("relative_residual").get<double>(), 1e-3);
  EXPECT_EQ(json.at("error").at("exit_code"), 1);
}

TEST_F(SolveCommand, the_residual_is_the_one_that_the_help_defines) {
  // x = (1, 0) of the generalized inverse against b = (1, 0): the two possible choices of the dropped row both leave a
  // residual of 1 in one row, with ||A|| = 2, ||x|| = 1 and ||b|| = 1, or 0 of the second choice, with x = 0.
  const std::string a = matrix("a.mtx", "coordinate real symmetric", "2 2 3\n1 1 1\n2 1 1\n2 2 1\n");
  const std::string b = matrix("b.mtx", "array real general", "2 1\n1\n0\n");
  const Outcome run = qxsm({"solve", a, "-b", b, "--json"});
  EXPECT_EQ(run.code, 1);
  const auto json = run.json();
  const bool first_kept = json.at("rows_dropped")[0] == 2;
  EXPECT_DOUBLE_EQ(json.at("largest_residual").get<double>(), first_kept ? 1.0 / 3.0 : 1.0);
}

TEST_F(SolveCommand, an_indefinite_matrix_is_refused_and_no_solution_is_left_behind) {
  const std::string a = matrix("a.mtx", "coordinate real symmetric", "2 2 3\n1 1 1\n2 1 2\n2 2 1\n");
  const std::string x = path("x.mtx");
  expect_message(qxsm({"solve", a, "-o", x}), 1, {a + ": not positive semidefinite", "; check the entries"});
  EXPECT_FALSE(std::filesystem::exists(x));
}

TEST_F(SolveCommand, a_solution_that_overflows_is_no_answer) {
  const std::string a = matrix("a.mtx", "coordinate real symmetric", "1 1 1\n1 1 1e-300\n");
  const std::string b = matrix("b.mtx", "array real general", "1 2\n1e300\n1e-300\n");
  const Outcome run = qxsm({"solve", a, "-b", b, "--json"});
  EXPECT_EQ(run.code, 1);
  EXPECT_NE(run.err.find("the solution overflows for the right-hand sides 1; scale"), std::string::npos) << run.err;
  EXPECT_TRUE(run.json().at("largest_residual").is_null());
}

// Infinities of both signs meet in the first two rows; the last row alone would look exact.
TEST_F(SolveCommand, a_residual_that_is_no_number_is_not_lost_among_others) {
  const std::string a =
      matrix("a.mtx", "coordinate real symmetric", "3 3 4\n1 1 2e-300\n2 1 1e-300\n2 2 2e-300\n3 3 1\n");
  const std::string b = matrix("b.mtx", "array real general", "3 1\n1e300\n-1e300\n1\n");
  const Outcome run = qxsm({"solve", a, "-b", b, "--json"});
  EXPECT_EQ(run.code, 1);
  EXPECT_NE(run.err.find("the solution overflows for the right-hand sides 1; scale"), std::string::npos) << run.err;
}

TEST_F(SolveCommand, the_output_must_be_writable_and_not_an_input) {
  const std::string a = file("a.mtx", read(shipped("bcsstk01.mtx")));
  expect_message(qxsm({"solve", a, "-o", path("no/x.mtx")}), 2,
                 {path("no/x.mtx") + ": cannot be written (No such file", "; check that"});
  expect_message(qxsm({"solve", a, "-o", a}), 2, {a + ": is also an input", "; give -o a path of its own"});
  EXPECT_EQ(read(a), read(shipped("bcsstk01.mtx")));
}

TEST_F(SolveCommand, a_matrix_without_rows_has_an_empty_solution) {
  const std::string x = path("x.mtx");
  const Outcome run = qxsm({"solve", matrix("a.mtx", "coordinate real symmetric", "0 0 0\n"), "-o", x});
  EXPECT_EQ(run.code, 0) << run.err;
  EXPECT_TRUE(array_values(read(x).substr(read(x).find("0 1\n") + 4)).empty());
  EXPECT_EQ(run.fact("relative residual"), "0.000e+00");
}

}  // namespace
}  // namespace sm::test
