// qxsm solve --method cg.
#include <cmath>

#include "cli/command.hpp"
#include "cli/dense.hpp"

namespace sm::test {
namespace {

using Vector = std::vector<long double>;

class GradientsCommand : public CommandTest {
 protected:
  static Vector times(const DenseMatrix& a, const Vector& x) {
    Vector y(a.size(), 0.0L);
    for (std::size_t i = 0; i < a.size(); ++i) {
      for (std::size_t j = 0; j < x.size(); ++j) y[i] += a[i][j] * x[j];
    }
    return y;
  }
  static long double dot(const Vector& x, const Vector& y) {
    long double sum = 0.0L;
    for (std::size_t i = 0; i < x.size(); ++i) sum += x[i] * y[i];
    return sum;
  }
  // sqrt(r' M r) after each of `steps` textbook steps with M = 1 / diagonal, as parts of the first.
  static std::vector<double> textbook(const DenseMatrix& a, const Vector& b, int steps) {
    const auto apply = [&](const Vector& r) {
      Vector z = r;
      for (std::size_t i = 0; i < r.size(); ++i) z[i] /= a[i][i];
      return z;
    };
    Vector r = b;
    Vector p = apply(r);
    const long double first = dot(r, p);
    long double rho = first;
    std::vector<double> parts;
    for (int k = 0; k < steps; ++k) {
      const Vector q = times(a, p);
      const long double alpha = rho / dot(p, q);
      for (std::size_t i = 0; i < r.size(); ++i) r[i] -= alpha * q[i];
      const Vector z = apply(r);
      const long double next = dot(r, z);
      for (std::size_t i = 0; i < r.size(); ++i) p[i] = z[i] + next / rho * p[i];
      rho = next;
      parts.push_back(static_cast<double>(std::sqrt(rho / first)));
    }
    return parts;
  }
  static Vector column(const DenseMatrix& b, std::size_t j) {
    Vector x;
    for (const auto& row : b) x.push_back(row[j]);
    return x;
  }
};

TEST_F(GradientsCommand, the_history_is_that_of_textbook_steps) {
  const DenseMatrix a = dense_file(read(shipped("gr_30_30.mtx")));
  const Outcome run = qxsm({"solve", shipped("gr_30_30.mtx"), "--method", "cg", "--json"});
  ASSERT_EQ(run.code, 0) << run.err;
  const auto json = run.json();
  EXPECT_EQ(json.at("method"), "cg");
  EXPECT_EQ(json.at("tolerance"), 1e-10);
  EXPECT_EQ(json.at("max_iterations"), 902);
  const auto& answer = json.at("right_hand_sides")[0];
  const auto history = answer.at("history").get<std::vector<double>>();
  EXPECT_EQ(answer.at("converged"), true);
  EXPECT_EQ(answer.at("iterations").get<std::size_t>(), history.size());
  EXPECT_EQ(json.at("iterations"), answer.at("iterations"));
  EXPECT_EQ(answer.at("preconditioned_residual").get<double>(), history.back());
  EXPECT_LE(history.back(), 1e-10);
  EXPECT_GT(history[history.size() - 2], 1e-10);
  const auto want = textbook(a, times(a, Vector(900, 1.0L)), 25);
  ASSERT_GE(history.size(), want.size());
  // Rounding errors grow with the steps.
  for (std::size_t k = 0; k < want.size(); ++k) EXPECT_NEAR(history[k], want[k], 1e-9 * want[k]) << k;
}

TEST_F(GradientsCommand, the_solution_is_that_of_a_dense_inverse) {
  const std::string x = path("x.mtx");
  const Outcome run = qxsm({"solve", shipped("bcsstk01.mtx"), "-b", shipped("bcsstk01_b.mtx"), "-o", x, "--method",
                            "cg", "--tolerance", "1e-13", "--max-iterations", "500"});
  ASSERT_EQ(run.code, 0) << run.err;
  EXPECT_EQ(run.fact("method"), "conjugate gradients, preconditioned by the diagonal");
  EXPECT_EQ(run.fact("max iterations"), "500");
  EXPECT_EQ(run.fact("tolerance"), "1e-13");
  EXPECT_EQ(run.fact("solution"), "48 x 2, in " + x);
  const DenseMatrix inverse = dense_inverse(dense_file(read(shipped("bcsstk01.mtx"))));
  const DenseMatrix want = dense_product(inverse, dense_file(read(shipped("bcsstk01_b.mtx"))));
  const DenseMatrix got = dense_file(read(x));
  ASSERT_EQ(got.size(), 48u);
  for (std::size_t j = 0; j < 2; ++j) {
    const Vector solution = column(want, j);
    long double largest = 0.0L;
    for (const long double element : solution) largest = std::max(largest, std::fabs(element));
    for (std::size_t i = 0; i < 48; ++i) {
      EXPECT_NEAR(static_cast<double>(got[i][j]), static_cast<double>(want[i][j]), static_cast<double>(1e-7L * largest))
          << i;
    }
  }
}

TEST_F(GradientsCommand, too_few_iterations_end_with_1_and_leave_what_was_reached) {
  const std::string x = path("x.mtx");
  const Outcome run =
      qxsm({"solve", shipped("gr_30_30.mtx"), "--method", "cg", "--max-iterations", "5", "-o", x, "--json"});
  expect_message(run, 1,
                 {shipped("gr_30_30.mtx") + ": conjugate gradients have not converged for the right-hand sides 1",
                  "after 5 iterations", "; raise --max-iterations or --tolerance, or use --method direct"});
  const auto json = run.json();
  EXPECT_EQ(json.at("error").at("exit_code"), 1);
  EXPECT_EQ(json.at("right_hand_sides")[0].at("converged"), false);
  EXPECT_EQ(json.at("right_hand_sides")[0].at("history").size(), 5u);
  EXPECT_GT(json.at("largest_residual").get<double>(), 1e-6);
  EXPECT_EQ(array_values(read(x)).size(), 900u);
  const Outcome text = qxsm({"solve", shipped("gr_30_30.mtx"), "--method", "cg", "--max-iterations", "5"});
  EXPECT_NE(text.fact("relative residual").find(" after 5 iterations, not converged"), std::string::npos);
}

TEST_F(GradientsCommand, one_right_hand_side_that_fails_does_not_stop_the_others) {
  // The second needs two steps, the others one; the fourth none.
  const std::string a = matrix("a.mtx", "coordinate real symmetric", "2 2 3\n1 1 2\n2 1 1\n2 2 2\n");
  const std::string b = matrix("b.mtx", "array real general", "2 4\n3\n3\n1\n0\n1\n-1\n0\n0\n");
  const std::string x = path("x.mtx");
  const Outcome run = qxsm({"solve", a, "-b", b, "--method", "cg", "--max-iterations", "1", "-o", x, "--json"});
  expect_message(run, 1, {b + ": conjugate gradients have not converged for the right-hand sides 2 (number 2"});
  const auto json = run.json();
  const std::vector<bool> converged{true, false, true, true};
  const std::vector<int> iterations{1, 1, 1, 0};
  for (std::size_t j = 0; j < 4; ++j) {
    EXPECT_EQ(json.at("right_hand_sides")[j].at("converged"), converged[j]) << j;
    EXPECT_EQ(json.at("right_hand_sides")[j].at("iterations"), iterations[j]) << j;
  }
  const auto values = array_values(read(x));
  ASSERT_EQ(values.size(), 8u);
  EXPECT_NEAR(values[0], 1.0, 1e-15);
  EXPECT_NEAR(values[4], 1.0, 1e-15);
  EXPECT_EQ(values[6], 0.0);
  EXPECT_EQ(qxsm({"solve", a, "-b", b, "--method", "cg", "--max-iterations", "2", "--quiet"}).code, 0);
}

TEST_F(GradientsCommand, a_consistent_singular_matrix_is_solved_and_an_empty_row_is_not) {
  const std::string a = matrix("a.mtx", "coordinate real symmetric", "3 3 3\n1 1 1\n2 1 -1\n2 2 1\n");
  const std::string good = matrix("g.mtx", "array real general", "3 1\n2\n-2\n0\n");
  const Outcome run = qxsm({"solve", a, "-b", good, "--method", "cg", "--json"});
  EXPECT_EQ(run.code, 0) << run.err;
  EXPECT_LE(run.json().at("largest_residual").get<double>(), 1e-15);
  const std::string bad = matrix("b.mtx", "array real general", "3 1\n2\n-2\n1\n");
  const Outcome refused = qxsm({"solve", a, "-b", bad, "--method", "cg", "--json"});
  expect_message(refused, 1, {bad + ": A x = b has no solution for the right-hand sides 1"});
  EXPECT_EQ(refused.json().at("right_hand_sides")[0].at("consistent"), false);
}

TEST_F(GradientsCommand, a_negative_diagonal_ends_with_1) {
  const std::string a = matrix("a.mtx", "coordinate real symmetric", "2 2 2\n1 1 1\n2 2 -7.5\n");
  expect_message(qxsm({"solve", a, "--method", "cg"}), 1,
                 {a + ": not positive semidefinite", "; the diagonal goes down to -7.5: check the signs"});
}

TEST_F(GradientsCommand, a_breakdown_is_not_taken_for_an_answer) {
  // p' A p = 0 for p = (1, -1).
  const std::string a = matrix("a.mtx", "coordinate real symmetric", "2 2 3\n1 1 1\n2 1 1\n2 2 1\n");
  const std::string b = matrix("b.mtx", "array real general", "2 1\n1\n-1\n");
  const Outcome run = qxsm({"solve", a, "-b", b, "--method", "cg", "--json"});
  EXPECT_EQ(run.code, 1) << run.err;
  EXPECT_EQ(run.json().at("right_hand_sides")[0].at("converged"), false);
}

TEST_F(GradientsCommand, a_matrix_without_rows_is_solved) {
  const Outcome run = qxsm({"solve", matrix("e.mtx", "coordinate real symmetric", "0 0 0\n"), "--method", "cg"});
  EXPECT_EQ(run.code, 0) << run.err;
  EXPECT_EQ(run.fact("iterations"), "0 (the most for one right-hand side)");
}

TEST_F(GradientsCommand, its_options_go_with_its_method_only) {
  const std::string a = shipped("bcsstk01.mtx");
  expect_message(qxsm({"solve", a, "--tolerance", "1e-8"}), 2,
                 {"--tolerance is given, expected --method cg with it", "; see qxsm solve --help"});
  expect_message(qxsm({"solve", a, "--method", "direct", "--max-iterations", "3"}), 2,
                 {"--max-iterations is given, expected --method cg with it", "; see qxsm solve --help"});
  expect_message(qxsm({"solve", a, "--method", "cg", "--tolerance", "-1"}), 2, {"--tolerance: found \"-1\""});
  for (const char* bad : {"0", "-3", "2.5"}) {
    expect_message(qxsm({"solve", a, "--method", "cg", "--max-iterations", bad}), 2,
                   {"--max-iterations: found \"", "expected a whole number above 0"});
  }
}

}  // namespace
}  // namespace sm::test
