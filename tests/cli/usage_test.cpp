#include "cli/command.hpp"

namespace sm::test {
namespace {

TEST(Usage, wrong_usage_ends_with_2_and_says_where_help_is) {
  expect_message(qxsm({}), 2, {"subcommand is required", "; see qxsm --help"});
  expect_message(
      qxsm({"invert", "a.mtx"}), 2,
      {"found the subcommand \"invert\", expected info, factor, solve, invdiag, quad, trace, hermite, estimable, "
       "convert, pedigree, lmm, reml, blup or grid",
       "; see qxsm --help"});
  expect_message(qxsm({"solve"}), 2, {"A.mtx is required", "; see qxsm solve --help"});
  expect_message(qxsm({"solve", "a.mtx", "--frobnicate"}), 2, {"--frobnicate", "; see qxsm solve --help"});
  expect_message(qxsm({"factor", "a.mtx", "b.mtx"}), 2, {"b.mtx", "; see qxsm factor --help"});
  expect_message(qxsm({"lmm", "d.csv", "y ~ x", "--outt", "x"}), 2,
                 {"found --outt, which is no option of qxsm lmm (did you mean --out?)", "; see qxsm lmm --help"});
  expect_message(qxsm({"lmm", "d.csv", "y ~ x", "--zzzzzz=3"}), 2,
                 {"found --zzzzzz, which is no option of qxsm lmm; see qxsm lmm --help"});
  expect_message(qxsm({"lmm", "d.csv", "y", "x", "g"}), 2, {"found \"x g\" behind the last argument", "in quotes"});
  expect_message(qxsm({"lmm", "y ~ x", "d.csv"}), 2,
                 {"found the formula \"y ~ x\" where the data are to be named", "DATA FORMULA"});
  expect_message(qxsm({"solve", "a.mtx", "-b"}), 2, {"--rhs", "; see qxsm solve --help"});
}

TEST(Usage, bad_values_of_options_end_with_2_and_say_what_is_good) {
  for (const char* bad : {"0", "-1", "4Q", "1.5G", "much", ""}) {
    expect_message(qxsm({"info", "a.mtx", "--memory", bad}), 2,
                   {"--memory: found \"", "(4G)", "; see qxsm info --help"});
  }
  expect_message(qxsm({"solve", "a.mtx", "--method", "magic"}), 2,
                 {"found \"magic\", expected direct or cg", "; see qxsm"});
  expect_message(qxsm({"grid", "0", "5"}), 2, {"NX: found \"0\", expected a whole number above 0", "; see qxsm grid"});
  expect_message(qxsm({"grid", "5", "2.5"}), 2, {"NY: found \"2.5\"", "; see qxsm grid"});
  expect_message(qxsm({"grid", "5", "5", "--shift", "nan"}), 2, {"--shift: found \"nan\"", "; see qxsm grid"});
}

TEST(Usage, wrong_usage_is_an_object_too_when_json_is_asked_for) {
  const Outcome run = qxsm({"solve", "--json", "--frobnicate"});
  EXPECT_EQ(run.code, 2);
  EXPECT_EQ(run.json().at("error").at("exit_code"), 2);
  EXPECT_EQ(run.err, "qxsm: " + run.json().at("error").at("message").get<std::string>() + "\n");
}

TEST(Usage, standard_output_is_not_promised_twice) {
  expect_message(qxsm({"solve", "a.mtx", "--json", "-o", "-"}), 2, {"standard output", "; send the result to a file"});
  expect_message(qxsm({"solve", "-", "-b", "-"}), 2, {"standard input", "; give one of them as a file"});
}

TEST(Usage, an_option_of_a_subcommand_in_front_of_it_is_named) {
  expect_message(qxsm({"--json", "info", "a.mtx"}), 2, {"--json", "no option of qxsm"});
}

TEST(Usage, the_version_is_printed) {
  const Outcome run = qxsm({"--version"});
  EXPECT_EQ(run.code, 0);
  EXPECT_EQ(run.out.rfind("qxsm ", 0), 0u) << run.out;
  EXPECT_EQ(run.out.find('\n'), run.out.size() - 1);
}

}  // namespace
}  // namespace sm::test
