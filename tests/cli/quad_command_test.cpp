#include <filesystem>

#include "cli/command.hpp"
#include "cli/dense.hpp"

namespace sm::test {
namespace {

class QuadCommand : public CommandTest {
 protected:
  // The form that the command writes for these arguments.
  DenseMatrix form_of(std::vector<std::string> arguments) const {
    const std::string f = path("f.mtx");
    arguments.insert(arguments.begin(), "quad");
    arguments.insert(arguments.end(), {"-o", f, "--quiet"});
    const Outcome run = qxsm(arguments);
    EXPECT_EQ(run.code, 0) << run.err;
    return dense_file(read(f));
  }
  // A dense file with the same elements as a coordinate file.
  std::string as_array(const std::string& name, const std::string& coordinates) const {
    const DenseMatrix a = dense_file(read(coordinates));
    std::string text = std::to_string(a.size()) + " " + std::to_string(a.at(0).size()) + "\n";
    for (std::size_t j = 0; j < a[0].size(); ++j) {
      for (const auto& row : a) text += std::to_string(static_cast<double>(row[j])) + "\n";
    }
    return matrix(name, "array real general", text);
  }
};

TEST_F(QuadCommand, a_form_of_a_shipped_matrix_is_that_of_a_dense_product) {
  const std::string a = shipped("bcsstk01.mtx");
  const std::string sparse = scattered("x.mtx", 7, 48, false, 21);
  const std::string dense = as_array("y.mtx", sparse);
  const DenseMatrix want = dense_form(dense_file(read(sparse)), dense_file(read(a)));
  // Elements of A are up to 2e9, those of X up to 8, and there are 48 of them.
  const double tolerance = 1e-14 * 2e9 * 8 * 8 * 48;
  expect_near(form_of({a, sparse}), want, tolerance);
  EXPECT_EQ(read(path("f.mtx")).rfind("%%MatrixMarket matrix coordinate real symmetric\n", 0), 0u);
  expect_near(form_of({a, dense}), want, tolerance);
  EXPECT_EQ(read(path("f.mtx")).rfind("%%MatrixMarket matrix array real symmetric\n", 0), 0u);
}

TEST_F(QuadCommand, a_form_in_the_inverse_is_that_of_a_dense_inverse) {
  const std::string a = shipped("bcsstk01.mtx");
  const std::string x = scattered("x.mtx", 5, 48, false, 22);
  const DenseMatrix want = dense_form(dense_file(read(x)), dense_inverse(dense_file(read(a))));
  double largest = 0.0;
  for (std::size_t i = 0; i < want.size(); ++i) largest = std::max(largest, static_cast<double>(want[i][i]));
  // The condition number is below 1e7.
  expect_near(form_of({a, x, "--inverse"}), want, 1e-9 * largest);
  expect_near(form_of({a, as_array("y.mtx", x), "--inverse"}), want, 1e-9 * largest);
}

TEST_F(QuadCommand, symmetric_rows_count_with_both_triangles) {
  const std::string a = scattered("a.mtx", 9, 9, true, 23);
  const std::string x = scattered("x.mtx", 9, 9, true, 24);
  const DenseMatrix want = dense_form(dense_file(read(x)), dense_file(read(a)));
  expect_near(form_of({a, x}), want, 0.0);
  const std::string packed = path("packed.mtx");
  ASSERT_EQ(qxsm({"convert", x, packed, "--to", "packed"}).code, 0);
  expect_near(form_of({a, packed}), want, 0.0);
  const std::string definite = shipped("bcsstk01.mtx");
  // A A^- A = A, with A in both places.
  expect_near(form_of({definite, definite, "--inverse"}), dense_file(read(definite)), 1e-9 * 2.5e9);
}

TEST_F(QuadCommand, variances_of_estimable_rows_do_not_depend_on_the_row_that_is_dropped) {
  const DenseMatrix form = form_of({shipped("oneway.mtx"), shipped("oneway_means.mtx"), "--inverse"});
  const DenseMatrix a = dense_file(read(shipped("oneway.mtx")));
  for (std::size_t dropped = 0; dropped < 4; ++dropped) {
    expect_near(form, dense_form(dense_file(read(shipped("oneway_means.mtx"))), inverse_without(a, dropped)), 1e-15);
  }
}

TEST_F(QuadCommand, the_diagonal_is_reported_and_the_file_named) {
  const std::string a = shipped("oneway.mtx");
  const std::string x = shipped("oneway_means.mtx");
  const Outcome text = qxsm({"quad", a, x});
  ASSERT_EQ(text.code, 0) << text.err;
  EXPECT_EQ(text.fact("form"), "3 x 3, 6 values in its lower triangle");
  EXPECT_EQ(text.fact("diagonal 1"), "12");  // 6 + 2 2 + 2
  EXPECT_EQ(text.fact("diagonal 2"), "15");
  EXPECT_EQ(text.fact("diagonal 3"), "9");
  EXPECT_EQ(text.fact("written"), "to no file (see -o)");
  const auto json = qxsm({"quad", a, x, "--inverse", "--json"}).json();
  EXPECT_EQ(json.at("command"), "quad");
  EXPECT_EQ(json.at("of"), "X A^- X'");
  EXPECT_EQ(json.at("rows_file"), x);
  EXPECT_EQ(json.at("rank"), 3);
  EXPECT_EQ(json.at("form_order"), 3);
  EXPECT_EQ(json.at("form_values"), 6);
  EXPECT_NEAR(json.at("first_values")[1].get<double>(), 1.0 / 3.0, 1e-16);
  EXPECT_TRUE(json.at("output").is_null());
}

TEST_F(QuadCommand, an_asymmetric_matrix_and_rows_of_another_length_end_with_2) {
  const std::string general = scattered("g.mtx", 4, 4, false, 25);
  const std::string symmetric = scattered("s.mtx", 4, 4, true, 26);
  const std::string wide = scattered("w.mtx", 2, 5, false, 27);
  expect_message(qxsm({"quad", general, symmetric}), 2,
                 {general + ": found ", "expected a symmetric matrix", "; only symmetric matrices have forms"});
  expect_message(qxsm({"quad", symmetric, wide}), 2,
                 {wide + ":2: found 5 columns, expected 4, the order of the matrix", "; give a file"});
  expect_message(qxsm({"quad", "-", "-"}), 2, {"standard input", "; give one of them as a file"});
  expect_message(qxsm({"quad", symmetric}), 2, {"X.mtx is required", "; see qxsm quad --help"});
}

TEST_F(QuadCommand, an_overflow_ends_with_1_and_leaves_no_file) {
  const std::string a = matrix("a.mtx", "coordinate real symmetric", "2 2 2\n1 1 1e200\n2 2 1\n");
  const std::string f = path("f.mtx");
  const std::string sparse = matrix("x.mtx", "coordinate real general", "1 2 1\n1 1 1e100\n");
  expect_message(qxsm({"quad", a, sparse, "-o", f}), 1, {a + ": the form can overflow", "; scale"});
  const std::string dense = matrix("y.mtx", "array real general", "1 2\n1e100\n0\n");
  expect_message(qxsm({"quad", a, dense, "-o", f}), 1, {a + ": the form overflows", "; scale"});
  const std::string indefinite = matrix("i.mtx", "coordinate real symmetric", "2 2 3\n1 1 1\n2 1 2\n2 2 1\n");
  expect_message(qxsm({"quad", indefinite, dense, "--inverse", "-o", f}), 1, {"not positive semidefinite"});
  EXPECT_FALSE(std::filesystem::exists(f));
}

TEST_F(QuadCommand, matrices_without_elements_have_forms_too) {
  const std::string zero = matrix("z.mtx", "coordinate real symmetric", "2 2 0\n");
  const std::string rows = matrix("x.mtx", "coordinate real general", "3 2 0\n");
  const DenseMatrix nothing(3, std::vector<long double>(3, 0.0L));
  expect_near(form_of({zero, rows}), nothing, 0.0);
  expect_near(form_of({zero, rows, "--inverse"}), nothing, 0.0);
  const std::string empty = matrix("e.mtx", "coordinate real symmetric", "0 0 0\n");
  EXPECT_EQ(form_of({empty, empty}).size(), 0u);
  EXPECT_EQ(form_of({empty, empty, "--inverse"}).size(), 0u);
  const std::string flat = matrix("f0.mtx", "coordinate real general", "3 0 0\n");
  expect_near(form_of({empty, flat, "--inverse"}), nothing, 0.0);
  expect_message(qxsm({"quad", empty, flat}), 2,
                 {flat + ":2: found 3 rows and 0 columns, expected rows and columns, or neither", "; correct"});
}

}  // namespace
}  // namespace sm::test
