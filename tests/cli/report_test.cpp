#include "cli/report.hpp"

#include <gtest/gtest.h>
#include <unistd.h>

#include <array>
#include <csignal>
#include <limits>
#include <nlohmann/json.hpp>

namespace sm::cli {
namespace {

std::string rows_text(const std::string& name) {
  return "  \"" + name + R"(": [
    {
      "row": 1,
      "of": [
        0.5,
        -2.0
      ]
    },
    {},
    [
      [
        1,
        "a"
      ],
      [
        "b",
        2
      ]
    ]
  ])";
}

TEST(Report, each_fact_has_a_line_and_a_member) {
  Report report("test");
  report.add("rank", 3, "rank", "3 of 4");
  report.add("rows_dropped", {4}, "rows dropped", "4");
  report.add_json("seconds", 0.5);
  report.add_text("reading", "0.500 s");
  EXPECT_EQ(report.text(), "rank          3 of 4\nrows dropped  4\nreading       0.500 s\n");
  const auto json = nlohmann::json::parse(report.json());
  EXPECT_EQ(json["command"], "test");
  EXPECT_EQ(json["rank"], 3);
  EXPECT_EQ(json["rows_dropped"], nlohmann::json::array({4}));
  EXPECT_EQ(json["seconds"], 0.5);
  EXPECT_EQ(report.code(), ExitCode::fine);
}

TEST(Report, a_numerical_no_keeps_the_facts_and_adds_the_error) {
  Report report("test");
  report.add("rank", 3, "rank", "3 of 4");
  report.fail({.code = ExitCode::no, .file = "a.mtx", .what = "no", .advice = "do this"});
  EXPECT_EQ(report.code(), ExitCode::no);
  EXPECT_EQ(report.failure(), "a.mtx: no; do this");
  const auto json = nlohmann::json::parse(report.json());
  EXPECT_EQ(json["rank"], 3);
  EXPECT_EQ(json["error"]["exit_code"], 1);
  EXPECT_EQ(json["error"]["message"], "a.mtx: no; do this");
  EXPECT_TRUE(json["error"]["line"].is_null());
}

TEST(Report, what_json_cannot_hold_does_not_stop_it) {
  Report report("test");
  report.add_json("log_determinant", std::numeric_limits<double>::quiet_NaN());
  report.add_json("file", std::string("\xff.mtx"));
  const auto json = nlohmann::json::parse(report.json());
  EXPECT_TRUE(json["log_determinant"].is_null());
  EXPECT_EQ(json["file"], "\xef\xbf\xbd.mtx");
}

TEST(Report, json_has_every_kind_of_value) {
  Report report("test");
  report.add_json("none", Json());
  report.add_json("yes", true);
  report.add_json("smallest", std::numeric_limits<std::int64_t>::min());
  report.add_json("largest", std::numeric_limits<std::uint64_t>::max());
  report.add_json("words", std::vector<std::string>{"a", "\"\n"});
  report.add_json("empty", std::vector<double>());
  report.add_json("two_words", {"a", "b"});
  Json rows = Json::array();
  rows.push_back({{"row", 1}, {"of", {0.5, -2.0}}});
  rows.push_back(Json::object());
  rows.push_back({{1, "a"}, {"b", 2}});
  report.add_json("rows", rows);
  report.add_json("rows_again", std::move(rows));
  report.add_json("yes", false);
  EXPECT_EQ(report.json(), R"({
  "command": "test",
  "none": null,
  "yes": false,
  "smallest": -9223372036854775808,
  "largest": 18446744073709551615,
  "words": [
    "a",
    "\"\n"
  ],
  "empty": [],
  "two_words": [
    "a",
    "b"
  ],
)" + rows_text("rows") + ",\n" +
                               rows_text("rows_again") + "\n}\n");
}

TEST(Report, writing_into_a_closed_pipe_is_an_error_with_a_name) {
  std::signal(SIGPIPE, SIG_IGN);
  std::array<int, 2> ends{};
  ASSERT_EQ(pipe(ends.data()), 0);
  close(ends[0]);
  try {
    write_all(ends[1], "text", "standard output");
    FAIL();
  } catch (const CommandError& error) {
    EXPECT_NE(std::string(error.what()).find("standard output: cannot be written (Broken pipe)"), std::string::npos);
    EXPECT_EQ(error.problem().code, ExitCode::bad_input);
  }
  close(ends[1]);
}

}  // namespace
}  // namespace sm::cli
