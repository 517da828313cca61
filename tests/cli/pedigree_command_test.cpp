#include <cmath>
#include <filesystem>
#include <map>
#include <sstream>

#include "cli/command.hpp"
#include "cli/dense.hpp"

namespace sm::test {
namespace {

class PedigreeCommand : public CommandTest {
 protected:
  // The second column of a CSV file by the first.
  static std::map<std::string, double> column(const std::string& text, const std::string& heading) {
    std::istringstream lines(text);
    std::string line;
    std::getline(lines, line);
    EXPECT_EQ(line, heading);
    std::map<std::string, double> values;
    while (std::getline(lines, line))
      values[line.substr(0, line.rfind(','))] = std::stod(line.substr(line.rfind(',') + 1));
    return values;
  }
};

TEST_F(PedigreeCommand, tells_what_a_textbook_says_of_six_animals) {
  const auto json = qxsm({"pedigree", shipped("six_animals.csv"), "--json"}).json();
  EXPECT_EQ(json.at("command"), "pedigree");
  EXPECT_EQ(json.at("animals"), 6);
  EXPECT_EQ(json.at("founders"), 2);
  EXPECT_EQ(json.at("generations"), 4);
  EXPECT_EQ(json.at("inbred"), 2);
  EXPECT_EQ(json.at("mean_inbreeding"), 0.25 / 6.0);
  EXPECT_EQ(json.at("max_inbreeding"), 0.125);
  EXPECT_NEAR(json.at("log_determinant").get<double>(), std::log(0.5 * 0.75 * 0.5 * 0.46875), 1e-14);
  EXPECT_EQ(json.at("inverse_entries"), 16);
  EXPECT_TRUE(json.at("notes").empty());
  EXPECT_TRUE(json.at("written").empty());
}

TEST_F(PedigreeCommand, writes_matrices_that_are_inverse_to_each_other_and_columns_in_the_order_of_the_file) {
  const std::string p = file("p.csv", "id;dam;sire\nx;b;a\n\"b;2\";;x\na;;\nb;;\ny;\"b;2\";x\nz;q;y\n");
  const Outcome run = qxsm({"pedigree", p, "--a", path("a.mtx"), "--ainv", path("ainv.mtx"), "--inbreeding", path("f"),
                            "--mendelian", path("d"), "--ids", path("ids")});
  ASSERT_EQ(run.code, 0) << run.err;
  EXPECT_EQ(run.err, "");
  EXPECT_EQ(run.fact("note"), "1 parent has no row of its own and was added as a founder: q");
  EXPECT_EQ(read(path("ids")), "x\nb;2\na\nb\ny\nz\nq\n");
  const auto f = column(read(path("f")), "id,inbreeding");
  EXPECT_EQ(f.size(), 7u);
  EXPECT_EQ(f.at("y"), 0.25);
  EXPECT_EQ(f.at("b;2"), 0.0);
  const auto d = column(read(path("d")), "id,mendelian_variance");
  EXPECT_EQ(d.at("x"), 0.5);
  EXPECT_EQ(d.at("b;2"), 0.75);
  EXPECT_EQ(d.at("z"), 0.5 - 0.25 * 0.25);
  const DenseMatrix product = dense_product(dense_file(read(path("a.mtx"))), dense_file(read(path("ainv.mtx"))));
  DenseMatrix identity(7, std::vector<long double>(7, 0.0L));
  for (std::size_t i = 0; i < 7; ++i) identity[i][i] = 1.0L;
  expect_near(product, identity, 1e-14);
}

TEST_F(PedigreeCommand, writes_an_inverse_that_the_module_factors) {
  const std::string inverse = path("ainv.mtx.gz");
  const Outcome run = qxsm({"pedigree", shipped("six_animals.csv"), "--ainv", inverse});
  ASSERT_EQ(run.code, 0) << run.err;
  EXPECT_EQ(run.fact("written"), "ainv, in " + inverse);
  const auto json = qxsm({"factor", inverse, "--json"}).json();
  EXPECT_EQ(json.at("rank"), 6);
  EXPECT_NEAR(json.at("log_determinant").get<double>(), -std::log(0.5 * 0.75 * 0.5 * 0.46875), 1e-13);
}

TEST_F(PedigreeCommand, works_as_a_filter_with_the_report_on_standard_error) {
  const Outcome run = qxsm({"pedigree", "-", "--inbreeding", "-"}, {.input = "id,sire,dam\na,,\nb,a,a\n"});
  EXPECT_EQ(run.code, 0);
  EXPECT_EQ(run.out, "id,inbreeding\na,0\nb,0.5\n");
  EXPECT_NE(run.err.find("selfing"), std::string::npos) << run.err;
}

TEST_F(PedigreeCommand, quotes_ids_that_would_not_read_back) {
  const std::string p = file("p.csv", "id,sire,dam\n\"a, the \"\"first\"\"\",,\n");
  EXPECT_EQ(qxsm({"pedigree", p, "--inbreeding", "-", "--quiet"}).out, "id,inbreeding\n\"a, the \"\"first\"\"\",0\n");
}

TEST_F(PedigreeCommand, names_what_is_wrong_with_its_place) {
  const std::string loop = file("loop.csv", "id,sire,dam\na,c,\nb,a,\nc,b,\n");
  expect_message(qxsm({"pedigree", loop}), 2,
                 {loop + ":2: 'a': 3 animals descend", "(a -> b -> c -> a, ", "; correct"});
  const Outcome run = qxsm({"pedigree", loop, "--json"});
  EXPECT_EQ(run.code, 2);
  const auto error = run.json().at("error");
  EXPECT_EQ(error.at("exit_code"), 2);
  EXPECT_EQ(error.at("file"), loop);
  EXPECT_EQ(error.at("line"), 2);
  EXPECT_EQ(error.at("variable"), "a");
  EXPECT_EQ(run.err, "qxsm: " + error.at("message").get<std::string>() + "\n");
  expect_message(qxsm({"pedigree", path("none.csv")}), 2, {path("none.csv") + ": cannot be read (No such file", "; "});
}

TEST_F(PedigreeCommand, leaves_no_file_behind_when_it_fails) {
  const std::string loop = file("loop.csv", "id,sire,dam\na,b,\nb,a,\n");
  EXPECT_EQ(qxsm({"pedigree", loop, "--ainv", path("ainv.mtx")}).code, 2);
  EXPECT_FALSE(std::filesystem::exists(path("ainv.mtx")));
}

TEST_F(PedigreeCommand, refuses_two_results_for_one_file_and_the_pedigree_as_one) {
  const std::string p = shipped("six_animals.csv");
  expect_message(qxsm({"pedigree", p, "--a", "-", "--ainv", "-"}), 2, {"standard output: two results", "; give each"});
  expect_message(qxsm({"pedigree", p, "--a", path("x"), "--ids", path("x")}), 2, {path("x") + ": two results"});
  expect_message(qxsm({"pedigree", p, "--a", "-", "--json"}), 2, {"--json and the result both want standard output"});
  const std::string own = file("p.csv", read(p));
  expect_message(qxsm({"pedigree", own, "--ainv", own}), 2, {own + ": is also an input"});
  EXPECT_EQ(read(own), read(p));
}

TEST_F(PedigreeCommand, refuses_a_dense_matrix_that_does_not_fit_and_a_pedigree_too) {
  std::string text = "id,sire,dam\n";
  for (int i = 1; i <= 2000; ++i) text += std::to_string(i) + ",,\n";
  const std::string p = file("p.csv", text);
  expect_message(qxsm({"pedigree", p, "--a", path("a.mtx"), "--memory", "20M"}), 3,
                 {"out of memory: the relationship matrix A of a pedigree of 2000 animals", "need 30.5 MiB",
                  "expected at most 20.0 MiB; "});
  EXPECT_FALSE(std::filesystem::exists(path("a.mtx")));
  EXPECT_EQ(qxsm({"pedigree", p, "--memory", "20M"}).code, 0);
  EXPECT_EQ(qxsm({"pedigree", p, "--a", path("a.mtx"), "--memory", "40M"}).code, 0);
  expect_message(qxsm({"pedigree", p, "--memory", "512K"}), 3, {"out of memory: a pedigree of 2000 animals need"});
}

TEST_F(PedigreeCommand, reports_each_animal_where_no_file_is_named) {
  const std::vector<std::string> line{"pedigree", shipped("six_animals.csv"), "--inbreeding", "--mendelian"};
  const Outcome text = qxsm(line);
  EXPECT_EQ(text.code, 0);
  EXPECT_EQ(text.fact("animal 5"), "F 0.125, Mendelian variance 0.5");
  const Outcome run = qxsm({line[0], line[1], "--mendelian", "--json"});
  const auto list = run.json().at("per_animal");
  ASSERT_EQ(list.size(), 6u);
  EXPECT_EQ(list[0].at("mendelian_variance"), 0.46875);
  EXPECT_FALSE(list[0].contains("inbreeding"));
}

}  // namespace
}  // namespace sm::test
