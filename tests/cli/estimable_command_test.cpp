#include <cmath>

#include "cli/command.hpp"
#include "cli/dense.hpp"

namespace sm::test {
namespace {

class EstimableCommand : public CommandTest {
 protected:
  // Two crossed factors of 3 and 4 levels beside a mean, and two more observations: rank 6 of 8.
  std::string crossed() const {
    DenseMatrix a(8, std::vector<long double>(8, 0.0L));
    const auto observe = [&](std::size_t first, std::size_t second) {
      for (const std::size_t i : {std::size_t{0}, 1 + first, 4 + second}) {
        for (const std::size_t j : {std::size_t{0}, 1 + first, 4 + second}) a[i][j] += 1.0L;
      }
    };
    for (std::size_t i = 0; i < 3; ++i) {
      for (std::size_t j = 0; j < 4; ++j) observe(i, j);
    }
    observe(0, 0);
    observe(2, 3);
    std::string text = "8 8\n";
    for (std::size_t j = 0; j < 8; ++j) {
      for (std::size_t i = j; i < 8; ++i) text += std::to_string(static_cast<double>(a[i][j])) + "\n";
    }
    return matrix("crossed.mtx", "array real symmetric", text);
  }

  // Whether every null vector of a matrix of rank n - 2 is orthogonal to a row: elimination with complete pivoting, in
  // long double, of A with the row below it.
  static bool in_row_space(DenseMatrix a, const std::vector<long double>& row) {
    std::vector<long double> rest = row;
    std::vector<bool> used(a.size(), false);
    for (std::size_t step = 0; step < a.size(); ++step) {
      std::size_t p = 0;
      std::size_t q = 0;
      long double best = 0.0L;
      for (std::size_t i = 0; i < a.size(); ++i) {
        for (std::size_t j = 0; j < a.size() && !used[i]; ++j) {
          if (std::fabs(a[i][j]) > best) best = std::fabs(a[p = i][q = j]);
        }
      }
      if (best < 1e-9L) break;
      used[p] = true;
      for (std::size_t i = 0; i < a.size(); ++i) {
        const long double factor = i == p ? 0.0L : a[i][q] / a[p][q];
        for (std::size_t j = 0; j < a.size(); ++j) a[i][j] -= factor * a[p][j];
      }
      const long double factor = rest[q] / a[p][q];
      for (std::size_t j = 0; j < a.size(); ++j) rest[j] -= factor * a[p][j];
    }
    for (const long double element : rest) {
      if (std::fabs(element) > 1e-9L) return false;
    }
    return true;
  }
};

TEST_F(EstimableCommand, names_the_rows_of_the_shipped_example_that_fail) {
  const Outcome run = qxsm({"estimable", shipped("oneway.mtx"), shipped("oneway_l.mtx")});
  expect_message(run, 1, {shipped("oneway_l.mtx") + ": not estimable: rows 3, 4", "; an estimable row is"});
  EXPECT_EQ(run.fact("not estimable"), "2 of 4: 3, 4");
  for (const char* row : {"row 1", "row 2"}) {
    EXPECT_EQ(run.fact(row), "estimable (pivots open, Hermite form yes, check yes)");
  }
  const auto json = qxsm({"estimable", shipped("oneway.mtx"), shipped("oneway_l.mtx"), "--json"}).json();
  EXPECT_EQ(json.at("not_estimable").get<std::vector<int>>(), (std::vector<int>{3, 4}));
  EXPECT_EQ(json.at("error").at("exit_code"), 1);
  // Of the two, one is nothing but the dropped place, or both keep something of an accepted one.
  const int dropped = json.at("rows_dropped")[0].get<int>();
  for (std::size_t k : {std::size_t{2}, std::size_t{3}}) {
    const int place = k == 2 ? 2 : 1;
    const auto& pivots = json.at("rows_of_l")[k].at("pivots");
    EXPECT_TRUE(place == dropped ? pivots == false : pivots.is_null()) << k << pivots;
  }
}

TEST_F(EstimableCommand, agrees_with_dense_elimination_on_a_two_way_layout) {
  const std::string a = crossed();
  const DenseMatrix dense = dense_file(read(a));
  // Each unknown alone, each difference of two, and the rows of A themselves.
  DenseMatrix rows;
  for (std::size_t i = 0; i < 8; ++i) {
    for (std::size_t j = i; j < 8; ++j) {
      std::vector<long double> row(8, 0.0L);
      row[i] = 1.0L;
      if (j != i) row[j] = -1.0L;
      rows.push_back(row);
    }
  }
  rows.insert(rows.end(), dense.begin(), dense.end());
  std::string text = std::to_string(rows.size()) + " 8\n";
  for (std::size_t j = 0; j < 8; ++j) {
    for (const auto& row : rows) text += std::to_string(static_cast<double>(row[j])) + "\n";
  }
  const Outcome run = qxsm({"estimable", a, matrix("l.mtx", "array real general", text), "--json"});
  EXPECT_EQ(run.code, 1) << run.err;
  const auto json = run.json();
  EXPECT_EQ(json.at("rank"), 6);
  ASSERT_EQ(json.at("rows_of_l").size(), rows.size());
  std::size_t passed = 0;
  for (std::size_t k = 0; k < rows.size(); ++k) {
    const auto& verdict = json.at("rows_of_l")[k];
    const bool want = in_row_space(dense, rows[k]);
    passed += want ? 1 : 0;
    EXPECT_EQ(verdict.at("estimable"), want) << k;
    EXPECT_EQ(verdict.at("hermite"), want) << k;
    EXPECT_EQ(verdict.at("check"), want) << k;
    EXPECT_TRUE(verdict.at("pivots").is_null() || verdict.at("pivots") == want) << k;
  }
  // The differences within either factor, 3 + 6, and the 8 rows of A.
  EXPECT_EQ(passed, 17u);
}

TEST_F(EstimableCommand, every_row_is_estimable_with_a_regular_shipped_matrix) {
  const std::string l = scattered("l.mtx", 12, 48, false, 31);
  const Outcome run = qxsm({"estimable", shipped("bcsstk01.mtx"), l});
  EXPECT_EQ(run.code, 0) << run.err;
  EXPECT_EQ(run.fact("not estimable"), "none");
  EXPECT_EQ(run.fact("row 10"), "estimable (pivots yes, Hermite form yes, check yes)");
  EXPECT_EQ(run.fact("..."), "2 more");
}

TEST_F(EstimableCommand, the_tolerance_is_a_part_of_the_largest_element) {
  // Off the row space of the one-way layout by 1e-3 in an element of 1, next to one of 1000.
  const std::string a = shipped("oneway.mtx");
  const std::string l = matrix("l.mtx", "coordinate real general", "1 4 3\n1 1 1000.001\n1 2 1000\n1 3 0\n");
  EXPECT_EQ(qxsm({"estimable", a, l, "--tolerance", "1e-5", "--quiet"}).code, 0);
  EXPECT_EQ(qxsm({"estimable", a, l, "--tolerance", "1e-7", "--quiet"}).code, 1);
  EXPECT_EQ(qxsm({"estimable", a, l, "--tolerance", "1e-5", "--json"}).json().at("tolerance"), 1e-5);
}

TEST_F(EstimableCommand, matrices_without_elements_leave_only_zeros_estimable) {
  const std::string zero = matrix("z.mtx", "coordinate real symmetric", "2 2 0\n");
  const std::string l = matrix("l.mtx", "coordinate real general", "2 2 1\n2 1 1\n");
  EXPECT_EQ(qxsm({"estimable", zero, l, "--json"}).json().at("not_estimable").get<std::vector<int>>(),
            std::vector<int>{2});
  const std::string empty = matrix("e.mtx", "coordinate real symmetric", "0 0 0\n");
  EXPECT_EQ(qxsm({"estimable", empty, matrix("f.mtx", "coordinate real general", "3 0 0\n")}).fact("row 3"),
            "estimable (pivots yes, Hermite form yes, check yes)");
  EXPECT_EQ(qxsm({"estimable", zero, matrix("n.mtx", "coordinate real general", "0 2 0\n")}).fact("not estimable"),
            "none");
}

TEST_F(EstimableCommand, bad_shapes_and_tolerances_end_with_2) {
  const std::string a = shipped("oneway.mtx");
  const std::string l = scattered("l.mtx", 2, 3, false, 32);
  expect_message(qxsm({"estimable", a, l}), 2, {l + ":2: found 3 columns, expected 4", "; give a file"});
  for (const char* bad : {"-1", "nan", "much"}) {
    expect_message(qxsm({"estimable", a, shipped("oneway_l.mtx"), "--tolerance", bad}), 2,
                   {"--tolerance: found \"", "a finite number, 0 or above", "; see qxsm estimable --help"});
  }
  const std::string indefinite = matrix("i.mtx", "coordinate real symmetric", "2 2 3\n1 1 1\n2 1 2\n2 2 1\n");
  expect_message(qxsm({"estimable", indefinite, indefinite}), 1, {"not positive semidefinite"});
}

}  // namespace
}  // namespace sm::test
