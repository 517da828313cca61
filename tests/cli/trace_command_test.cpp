#include <cmath>

#include "cli/command.hpp"
#include "cli/dense.hpp"

namespace sm::test {
namespace {

class TraceCommand : public CommandTest {
 protected:
  static double trace_of(const std::vector<std::string>& arguments) {
    std::vector<std::string> all{"trace", "--json"};
    all.insert(all.end(), arguments.begin(), arguments.end());
    const Outcome run = qxsm(all);
    EXPECT_EQ(run.code, 0) << run.err;
    return run.json().at("trace").get<double>();
  }
};

TEST_F(TraceCommand, sums_the_diagonal_of_general_and_symmetric_files) {
  const std::string general = scattered("g.mtx", 9, 9, false, 3);
  const std::string symmetric = scattered("s.mtx", 9, 9, true, 4);
  EXPECT_EQ(trace_of({general}), static_cast<double>(dense_trace(dense_of(read(general), 9, 9, false))));
  EXPECT_EQ(trace_of({symmetric}), static_cast<double>(dense_trace(dense_of(read(symmetric), 9, 9, true))));
  const Outcome run = qxsm({"trace", symmetric});
  EXPECT_EQ(std::stod(run.fact("tr(A)")), trace_of({symmetric}));
  EXPECT_EQ(run.fact("second matrix"), "none");
}

TEST_F(TraceCommand, takes_general_and_symmetric_factors_in_either_place) {
  for (const bool first : {false, true}) {
    for (const bool second : {false, true}) {
      const std::string a = scattered("a.mtx", 11, 11, first, 5);
      const std::string b = scattered("b.mtx", 11, 11, second, 6);
      const auto product = dense_product(dense_of(read(a), 11, 11, first), dense_of(read(b), 11, 11, second));
      EXPECT_EQ(trace_of({a, b}), static_cast<double>(dense_trace(product))) << first << second;
    }
  }
}

TEST_F(TraceCommand, takes_rectangular_factors_of_a_square_product) {
  const std::string a = scattered("a.mtx", 4, 7, false, 7);
  const std::string b = scattered("b.mtx", 7, 4, false, 8);
  const auto product = dense_product(dense_of(read(a), 4, 7, false), dense_of(read(b), 7, 4, false));
  EXPECT_EQ(trace_of({a, b}), static_cast<double>(dense_trace(product)));
  EXPECT_EQ(trace_of({b, a}), static_cast<double>(dense_trace(product)));
}

TEST_F(TraceCommand, takes_the_inverse_of_the_first_matrix) {
  const std::string a = shipped("bcsstk01.mtx");
  const auto inverse = dense_inverse(dense_of(read(a), 48, 48, true));
  const auto alone = static_cast<double>(dense_trace(inverse));
  EXPECT_NEAR(trace_of({a, "--inverse"}), alone, 1e-9 * alone);
  for (const bool symmetric : {true, false}) {
    const std::string b = scattered("b.mtx", 48, 48, symmetric, 9);
    const auto product = dense_product(inverse, dense_of(read(b), 48, 48, symmetric));
    // tr(A^-) bounds the size of the terms, the entries of B are at most 8.
    EXPECT_NEAR(trace_of({a, b, "--inverse"}), static_cast<double>(dense_trace(product)), 1e-8 * alone);
  }
}

TEST_F(TraceCommand, leaves_a_dropped_row_out_of_the_inverse) {
  const std::string a = matrix("a.mtx", "coordinate real symmetric", "3 3 5\n1 1 1\n2 2 2\n3 3 1\n2 1 -1\n3 2 -1\n");
  const std::string b = matrix("b.mtx", "coordinate real symmetric", "3 3 4\n1 1 3\n2 2 5\n3 3 7\n3 1 2\n");
  const auto json = qxsm({"trace", a, b, "--inverse", "--json"}).json();
  EXPECT_EQ(json.at("of"), "A^- B");
  ASSERT_EQ(json.at("rows_dropped").size(), 1u);
  const auto inverse =
      inverse_without(dense_of(read(a), 3, 3, true), json.at("rows_dropped")[0].get<std::size_t>() - 1);
  const auto product = dense_product(inverse, dense_of(read(b), 3, 3, true));
  EXPECT_NEAR(json.at("trace").get<double>(), static_cast<double>(dense_trace(product)), 1e-13);
}

TEST_F(TraceCommand, matrices_without_entries_have_the_trace_0) {
  const std::string empty = matrix("e.mtx", "coordinate real symmetric", "0 0 0\n");
  const std::string zero = matrix("z.mtx", "coordinate real general", "3 3 0\n");
  const std::string flat = matrix("f.mtx", "coordinate real general", "3 0 0\n");
  const std::string tall = matrix("t.mtx", "coordinate real general", "0 3 0\n");
  for (const std::vector<std::string>& arguments : std::vector<std::vector<std::string>>{
           {empty}, {zero}, {zero, zero}, {flat, tall}, {empty, "--inverse"}, {zero, zero, "--inverse"}}) {
    EXPECT_EQ(trace_of(arguments), 0.0) << arguments[0];
  }
}

TEST_F(TraceCommand, shapes_without_a_trace_end_with_2) {
  const std::string wide = scattered("w.mtx", 3, 5, false, 10);
  const std::string square = scattered("s.mtx", 3, 3, true, 11);
  expect_message(qxsm({"trace", wide}), 2,
                 {wide + ":2: found 3 rows and 5 columns, expected a square matrix", "; only square"});
  expect_message(qxsm({"trace", square, wide}), 2,
                 {wide + ":2: found 3 rows and 5 columns, expected 3 rows and 3 columns", "; only square"});
  expect_message(qxsm({"trace", wide, "--inverse"}), 2, {wide + ":2: found 3 rows", "expected a square matrix"});
  expect_message(qxsm({"trace", "-", "-"}), 2, {"standard input", "; give one of them as a file"});
}

TEST_F(TraceCommand, an_indefinite_inverse_and_an_overflow_end_with_1) {
  const std::string a = matrix("a.mtx", "coordinate real symmetric", "2 2 3\n1 1 1\n2 1 2\n2 2 1\n");
  expect_message(qxsm({"trace", a, "--inverse"}), 1, {a + ": not positive semidefinite", "; check"});
  const std::string huge = matrix("h.mtx", "coordinate real general", "2 2 2\n1 1 1e308\n2 2 1e308\n");
  const Outcome run = qxsm({"trace", huge, "--json"});
  expect_message(run, 1, {huge + ": the trace overflows", "; scale"});
  EXPECT_TRUE(run.json().at("trace").is_null());
}

}  // namespace
}  // namespace sm::test
