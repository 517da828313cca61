// Files that the command refuses: exit code 2, nothing on standard output, and a message that can be acted upon.
#include "cli/command.hpp"

namespace sm::test {
namespace {

using BadFiles = CommandTest;

// All three subcommands read the same way.
void expect_refused(const std::string& path, const std::vector<std::string>& parts) {
  for (const char* command : {"info", "factor", "solve"}) {
    const Outcome run = qxsm({command, path});
    expect_message(run, 2, parts);
    EXPECT_EQ(run.out, "");
  }
}

TEST_F(BadFiles, a_missing_file_is_named_with_the_reason) {
  expect_refused(path("missing.mtx"), {path("missing.mtx") + ": cannot be opened (No such file or directory)",
                                       "expected a readable Matrix Market file", "; check the path"});
}

TEST_F(BadFiles, a_folder_is_not_a_file) {
  expect_refused(path(""), {"cannot be read (Is a directory)", "; check that this is the file you mean"});
}

TEST_F(BadFiles, a_truncated_file_says_how_many_entries_it_held_and_where_it_ends) {
  const std::string whole = read(shipped("bcsstk01.mtx"));
  std::size_t cut = 0;
  for (int line = 0; line < 103; ++line) cut = whole.find('\n', cut) + 1;
  const std::string bad = file("truncated.mtx", whole.substr(0, cut));
  expect_refused(bad, {bad + ":103: the file ends after 100 of 224 entries", "expected 224 (announced in line 3)",
                       "; the file looks truncated: fetch or write it again"});
  const std::string inside = file("inside.mtx", whole.substr(0, cut + 5));
  expect_refused(inside,
                 {inside + ":104: the file ends inside this line, after 100 of 224 entries", "; the file looks"});
}

TEST_F(BadFiles, a_truncated_gzip_file_says_so) {
  const std::string packed = read(std::string(QXSM_SOURCE) + "/fuzz/corpus/gzip_no_trailer.mtx.gz");
  const std::string bad = file("cut.mtx.gz", packed);
  expect_refused(bad, {bad + ":6: the gzip data end early after 4 of 4 entries", "; the file looks truncated"});
}

TEST_F(BadFiles, a_line_with_three_wrong_fields_is_quoted) {
  const std::string bad = matrix("fields.mtx", "coordinate real symmetric", "2 2 3\n1 1 4\none two three\n2 2 4\n");
  expect_refused(
      bad, {bad + ":4: found row \"one\"", "expected a row number, counted from 1", "; write one entry to a line"});
  const std::string few = matrix("few.mtx", "coordinate real symmetric", "2 2 3\n1 1 4\n3 4\n2 2 4\n");
  expect_refused(
      few, {few + ":4: found 2 fields (\"3 4\")", "expected 3 (row column value)", "; write one entry to a line"});
}

TEST_F(BadFiles, an_index_out_of_range_is_named_with_the_range) {
  const std::string bad = matrix("range.mtx", "coordinate real symmetric", "2 2 2\n1 1 4\n3 1 1\n");
  expect_refused(bad, {bad + ":4: found row 3, expected 1 to 2", "; correct the index, or the size in line 2"});
}

TEST_F(BadFiles, a_nan_is_refused_with_its_line) {
  const std::string bad = matrix("nan.mtx", "coordinate real symmetric", "2 2 2\n1 1 4\n2 1 NaN\n");
  expect_refused(bad, {bad + ":4: found value \"NaN\", expected a finite number", "; replace the value"});
  const std::string array = matrix("inf.mtx", "array real general", "1 1\n-inf\n");
  expect_refused(array, {array + ":3: found value \"-inf\", expected a finite number", "; replace the value"});
}

TEST_F(BadFiles, complex_matrices_are_refused_by_name) {
  const std::string bad = matrix("complex.mtx", "coordinate complex general", "1 1 1\n1 1 4 0\n");
  expect_refused(
      bad, {bad + ":1: found the field \"complex\"", "expected real or integer or pattern", "; complex matrices"});
}

TEST_F(BadFiles, a_matrix_that_is_not_square_cannot_be_factored_but_described) {
  const std::string bad = matrix("wide.mtx", "coordinate real general", "2 3 1\n1 3 4\n");
  for (const char* command : {"factor", "solve"}) {
    expect_message(qxsm({command, bad}), 2,
                   {bad + ":2: found 2 rows and 3 columns, expected a square matrix", "; only symmetric matrices"});
  }
  EXPECT_EQ(qxsm({"info", bad}).code, 0);
}

TEST_F(BadFiles, a_general_matrix_that_is_not_symmetric_is_refused_with_the_first_pair) {
  const std::string bad = matrix("unsymmetric.mtx", "coordinate real general", "2 2 4\n1 1 4\n1 2 1\n2 1 2\n2 2 4\n");
  for (const char* command : {"factor", "solve"}) {
    expect_message(
        qxsm({command, bad}), 2,
        {bad + ": found 2 at (2, 1) and 1 at (1, 2), expected a symmetric matrix", "; only symmetric matrices"});
  }
}

TEST_F(BadFiles, right_hand_sides_of_another_order_are_refused) {
  const std::string a = matrix("a.mtx", "coordinate real symmetric", "2 2 2\n1 1 4\n2 2 4\n");
  const std::string b = matrix("b.mtx", "array real general", "3 1\n1\n2\n3\n");
  expect_message(qxsm({"solve", a, "-b", b}), 2,
                 {b + ":2: found 3 rows, expected 2, the order of the matrix", "; give a file"});
  expect_message(qxsm({"solve", a, "-b", path("no.mtx")}), 2,
                 {path("no.mtx") + ": cannot be opened", "; check the path"});
}

TEST_F(BadFiles, json_holds_the_parts_of_the_message) {
  const std::string bad = matrix("few.mtx", "coordinate real symmetric", "2 2 1\n3 4\n");
  const Outcome run = qxsm({"solve", bad, "--json"});
  EXPECT_EQ(run.code, 2);
  const auto error = run.json().at("error");
  EXPECT_EQ(error.at("exit_code"), 2);
  EXPECT_EQ(error.at("file"), bad);
  EXPECT_EQ(error.at("line"), 3);
  EXPECT_EQ(error.at("what"), "found 2 fields (\"3 4\")");
  EXPECT_EQ(error.at("expected"), "3 (row column value)");
  EXPECT_EQ(run.err, "qxsm: " + error.at("message").get<std::string>() + "\n");
}

}  // namespace
}  // namespace sm::test
