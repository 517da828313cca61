#include <filesystem>

#include "cli/command.hpp"
#include "cli/dense.hpp"

namespace sm::test {
namespace {

class ConvertCommand : public CommandTest {
 protected:
  // Converts and answers what was written.
  std::string converted(const std::string& from, const std::string& to) const {
    const std::string out = path("converted_" + to + ".mtx");
    const Outcome run = qxsm({"convert", from, out, "--to", to});
    EXPECT_EQ(run.code, 0) << run.err;
    EXPECT_EQ(run.fact("written"), out);
    return read(out);
  }
  static std::string kind(const std::string& text) {
    const std::size_t begin = std::string("%%MatrixMarket matrix ").size();
    return text.substr(begin, text.find('\n') - begin);
  }
};

TEST_F(ConvertCommand, every_form_of_a_shipped_matrix_holds_the_same_elements) {
  const std::string a = shipped("bcsstk01.mtx");
  const DenseMatrix want = dense_file(read(a));
  for (const std::string first : {"sparse", "dense", "packed"}) {
    const std::string once = file(first + ".mtx", converted(a, first));
    expect_near(dense_file(read(once)), want, 0.0);
    for (const std::string second : {"sparse", "dense", "packed"}) {
      expect_near(dense_file(converted(once, second)), want, 0.0);
    }
  }
}

TEST_F(ConvertCommand, the_first_line_says_the_form) {
  const std::string symmetric = shipped("bcsstk01.mtx");
  EXPECT_EQ(kind(converted(symmetric, "sparse")), "coordinate real symmetric");
  EXPECT_EQ(kind(converted(symmetric, "dense")), "array real general");
  EXPECT_EQ(kind(converted(symmetric, "packed")), "array real symmetric");
  const std::string general = scattered("g.mtx", 5, 7, false, 41);
  EXPECT_EQ(kind(converted(general, "sparse")), "coordinate real general");
  EXPECT_EQ(kind(converted(general, "dense")), "array real general");
}

TEST_F(ConvertCommand, rectangles_go_there_and_back) {
  const std::string a = scattered("a.mtx", 5, 7, false, 42);
  const DenseMatrix want = dense_file(read(a));
  const std::string dense = file("d.mtx", converted(a, "dense"));
  expect_near(dense_file(read(dense)), want, 0.0);
  const std::string sparse = converted(dense, "sparse");
  expect_near(dense_file(sparse), want, 0.0);
  for (const auto& [row, col, value] : coordinate_entries(sparse)) EXPECT_NE(value, 0.0) << row << col;
}

TEST_F(ConvertCommand, a_packed_file_lists_the_lower_triangle_by_columns) {
  const std::string a = matrix("a.mtx", "coordinate integer symmetric", "3 3 4\n1 1 1\n3 1 5\n2 2 2\n3 3 3\n");
  EXPECT_EQ(array_values(converted(a, "packed")), (std::vector<double>{1, 0, 5, 2, 0, 3}));
  EXPECT_EQ(array_values(converted(a, "dense")), (std::vector<double>{1, 0, 5, 0, 2, 0, 5, 0, 3}));
}

TEST_F(ConvertCommand, a_sparse_file_has_sums_and_no_zeros) {
  const std::string a = matrix("a.mtx", "coordinate real symmetric", "3 3 4\n2 1 1\n2 1 2\n3 3 0\n3 2 0\n");
  const std::vector<std::tuple<int, int, double>> want{{1, 0, 3.0}};
  EXPECT_EQ(coordinate_entries(converted(a, "sparse")), want);
}

TEST_F(ConvertCommand, what_is_symmetric_only_in_value_can_be_packed) {
  const std::string a = matrix("a.mtx", "coordinate real general", "2 2 3\n1 1 4\n1 2 3\n2 1 3\n");
  EXPECT_EQ(array_values(converted(a, "packed")), (std::vector<double>{4, 3, 0}));
  const std::string array = matrix("d.mtx", "array real general", "2 2\n4\n3\n3\n0\n");
  EXPECT_EQ(array_values(converted(array, "packed")), (std::vector<double>{4, 3, 0}));
  EXPECT_EQ(kind(converted(array, "sparse")), "coordinate real general");
  const std::string skew = matrix("s.mtx", "array real general", "2 2\n4\n3\n2\n0\n");
  expect_message(qxsm({"convert", skew, path("x.mtx"), "--to", "packed"}), 2,
                 {skew + ": found 3 at (2, 1) and 2 at (1, 2)", "; only symmetric matrices are packed"});
  EXPECT_FALSE(std::filesystem::exists(path("x.mtx")));
}

TEST_F(ConvertCommand, a_name_in_gz_makes_a_gzip_file_that_reads_back) {
  const std::string packed = path("p.mtx.gz");
  ASSERT_EQ(qxsm({"convert", shipped("nos3.mtx"), packed, "--to", "sparse"}).code, 0);
  const std::string bytes = read(packed);
  EXPECT_EQ(bytes.substr(0, 2), "\x1f\x8b");
  EXPECT_LT(bytes.size(), read(shipped("nos3.mtx")).size());
  // Its lines are those of the file that is not packed, but for the comment.
  const std::string again = converted(packed, "sparse");
  EXPECT_EQ(coordinate_entries(again), coordinate_entries(converted(shipped("nos3.mtx"), "sparse")));
}

TEST_F(ConvertCommand, works_as_a_filter_without_a_word) {
  const std::string a = shipped("bcsstk01.mtx");
  const Outcome run = qxsm({"convert", "-", "-", "--to", "packed"}, {.input = read(a)});
  EXPECT_EQ(run.code, 0);
  EXPECT_EQ(run.err, "");
  expect_near(dense_file(run.out), dense_file(read(a)), 0.0);
}

TEST_F(ConvertCommand, json_tells_both_forms) {
  const std::string out = path("o.mtx");
  const auto json = qxsm({"convert", shipped("bcsstk01.mtx"), out, "--to", "packed", "--json"}).json();
  EXPECT_EQ(json.at("command"), "convert");
  EXPECT_EQ(json.at("format"), "coordinate real symmetric");
  EXPECT_EQ(json.at("to"), "packed");
  EXPECT_EQ(json.at("to_format"), "array real symmetric");
  EXPECT_EQ(json.at("values"), 48 * 49 / 2);
  EXPECT_EQ(json.at("output"), out);
}

TEST_F(ConvertCommand, matrices_without_rows_and_columns_can_be_converted_but_not_half_of_that) {
  const std::string empty = matrix("e.mtx", "coordinate real symmetric", "0 0 0\n");
  for (const std::string to : {"sparse", "dense", "packed"}) {
    EXPECT_EQ(dense_file(converted(empty, to)).size(), 0u) << to;
  }
  const std::string flat = matrix("f.mtx", "coordinate real general", "3 0 0\n");
  expect_message(qxsm({"convert", flat, path("x.mtx"), "--to", "dense"}), 2,
                 {flat + ":2: found 3 rows and 0 columns, expected rows and columns, or neither", "; correct"});
}

TEST_F(ConvertCommand, wrong_usage_ends_with_2) {
  const std::string a = file("a.mtx", read(shipped("bcsstk01.mtx")));
  expect_message(qxsm({"convert", a, path("x.mtx")}), 2, {"--to is required", "; see qxsm convert --help"});
  expect_message(qxsm({"convert", a, path("x.mtx"), "--to", "csv"}), 2,
                 {"found \"csv\", expected sparse, dense or packed", "; see qxsm convert --help"});
  expect_message(qxsm({"convert", a, a, "--to", "dense"}), 2, {a + ": is also an input"});
  expect_message(qxsm({"convert", a, "-", "--to", "dense", "--json"}), 2, {"standard output", "to a file"});
}

}  // namespace
}  // namespace sm::test
