#include "mixed/fit_files.hpp"

#include <gtest/gtest.h>
#include <stdlib.h>

#include <cmath>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <map>
#include <nlohmann/json.hpp>

#include "cli/bytes.hpp"
#include "cli/matrix_market.hpp"
#include "mixed/csv_reader.hpp"
#include "mixed/example_fit.hpp"
#include "mixed/scratch_folder.hpp"

namespace sm::mixed::test {
namespace {

using Strings = std::vector<std::string>;

std::string text_of(const Example& e, const std::string& name) {
  for (const NamedText& file : fit_files(e.model, e.fit)) {
    if (file.name == name) return file.text;
  }
  return "no such file";
}

Rows rows_of(const Example& e, const std::string& name) { return parsed_csv(text_of(e, name)); }

TEST(FitFiles, hold_the_fixed_effects_aliased_ones_without_numbers) {
  const Rows rows = rows_of(example_fit(), "fixef.csv");
  ASSERT_EQ(rows.size(), 5U);
  EXPECT_EQ(rows[0], (Strings{"name", "estimate", "se", "df", "t", "p", "aliased", "dependence"}));
  EXPECT_EQ(rows[2][0], "x");
  EXPECT_EQ(rows[2][1], "10.46729");
  EXPECT_EQ(rows[2][6], "false");
  EXPECT_NEAR(std::stod(rows[2][5]), 3.26e-6, 0.01e-6);
  EXPECT_EQ(rows[3], (Strings{"fb", "-0.25", "2.5", "", "-0.1", "", "false", ""}));
  EXPECT_EQ(rows[4], (Strings{"fc", "", "", "", "", "", "true", "fc = (Intercept) - fb"}));
}

TEST(FitFiles, hold_every_level_of_the_random_effects) {
  Example e = example_fit();
  const Rows rows = rows_of(e, "ranef.csv");
  ASSERT_EQ(rows.size(), 7U);
  EXPECT_EQ(rows[0], (Strings{"group", "term", "level", "estimate", "cond_sd", "pev_sd"}));
  EXPECT_EQ(rows[2], (Strings{"g", "(Intercept)", "v", "-40.5", "12.5", "13.5"}));
  EXPECT_EQ(rows[6], (Strings{"g", "x", "w", "38.25", "13", "14"}));
  e.fit.ranef[0].reliability = {0.5, 0.25, 0.125};
  e.fit.ranef[1].cond_sd.clear();
  const Rows more = rows_of(e, "ranef.csv");
  EXPECT_EQ(more[0].back(), "reliability");
  EXPECT_EQ(more[1], (Strings{"g", "(Intercept)", "u", "2.25", "12", "13", "0.5"}));
  EXPECT_EQ(more[4], (Strings{"g", "x", "u", "2.25", "", "13", ""}));
}

TEST(FitFiles, hold_the_variance_components) {
  const Rows rows = rows_of(example_fit(), "varcomp.csv");
  ASSERT_EQ(rows.size(), 5U);
  EXPECT_EQ(rows[1], (Strings{"g", "(Intercept)", "", "612", "24.7386", "288.75", "288.5"}));
  EXPECT_EQ(rows[2], (Strings{"g", "(Intercept)", "x", "9.5", "0.0655", "46.75", ""}));
  EXPECT_EQ(rows[4], (Strings{"Residual", "", "", "654", "25.5734", "77.25", ""}));
}

TEST(FitFiles, number_the_fitted_rows_as_the_table_has_them) {
  const Rows rows = rows_of(example_fit(), "fitted.csv");
  ASSERT_EQ(rows.size(), 5U);
  EXPECT_EQ(rows[0], (Strings{"row", "response", "fitted", "residual"}));
  EXPECT_EQ(rows[3], (Strings{"4", "4", "-47.1468", "51.1468"}));
}

TEST(FitFiles, write_numbers_that_read_back_as_the_same_doubles) {
  Example e = drawn_fit(40, 10);
  const Rows rows = rows_of(e, "ranef.csv");
  for (std::size_t i = 0; i < 40; ++i) EXPECT_EQ(std::stod(rows[i + 1][3]), e.fit.ranef[0].estimate[i]);
  e.fit.ranef[0].estimate[0] = std::nan("");
  EXPECT_EQ(rows_of(e, "ranef.csv")[1][3], "");
}

TEST(FitFiles, quote_hostile_levels_so_that_they_read_back) {
  Example e = drawn_fit(hostile_names().size(), 3);
  e.fit.ranef[0].levels = hostile_names();
  e.fit.ranef[0].group = "a,\"b\"\n";
  const Rows rows = rows_of(e, "ranef.csv");
  ASSERT_EQ(rows.size(), hostile_names().size() + 1);
  for (std::size_t i = 0; i < hostile_names().size(); ++i) {
    EXPECT_EQ(rows[i + 1][2], hostile_names()[i]);
    EXPECT_EQ(rows[i + 1][0], e.fit.ranef[0].group);
    EXPECT_EQ(rows[i + 1].size(), 6U);
  }
}

TEST(CsvField, is_quoted_only_where_it_must_be) {
  EXPECT_EQ(csv_field("plain name"), "plain name");
  EXPECT_EQ(csv_field("a,b"), "\"a,b\"");
  EXPECT_EQ(csv_field("say \"no\""), "\"say \"\"no\"\"\"");
  EXPECT_EQ(csv_field(" a"), "\" a\"");
  EXPECT_EQ(csv_field(""), "");
}

// The entries of a symmetric matrix, read by the command's own reader.
class Entries : public cli::EntrySink {
 public:
  void begin(const cli::Header& header) override { read = header; }
  void take(std::span<const cli::Entry> entries) override {
    for (const cli::Entry& entry : entries) values[{entry.row, entry.col}] = entry.value;
  }
  cli::Header read;
  std::map<std::pair<std::int64_t, std::int64_t>, double> values;
};

TEST(FitFiles, hold_the_covariances_as_a_matrix_that_the_command_reads) {
  Example e = example_fit();
  e.fit.fixef[1].name = "two\nlines" + std::string(3000, 'w');
  const ScratchFolder folder;
  write_fit(folder.path(), e.model, e.fit);
  const std::string path = folder.path() + "/vcov.mtx";
  cli::FileBytes source(path);
  Entries entries;
  cli::read_matrix_market(source, path, entries);
  EXPECT_EQ(entries.read.layout, cli::Layout::array);
  EXPECT_EQ(entries.read.symmetry, cli::Symmetry::symmetric);
  EXPECT_EQ(entries.read.rows, 3);
  const std::map<std::pair<std::int64_t, std::int64_t>, double> expected{{{0, 0}, 4.0}, {{0, 1}, -1.0}, {{0, 2}, 0.0},
                                                                         {{1, 1}, 1.0}, {{1, 2}, 0.5},  {{2, 2}, 4.0}};
  EXPECT_EQ(entries.values, expected);
}

TEST(FitFiles, take_the_place_of_those_of_an_earlier_fit) {
  Example e = example_fit();
  e.fit.predicted = {1.5, std::nan("")};
  const ScratchFolder folder;
  const std::string inner = folder.path() + "/new/folder";
  write_fit(inner, e.model, e.fit);
  EXPECT_EQ(names_in(inner),
            (Strings{"fit.json", "fitted.csv", "fixef.csv", "predicted.csv", "ranef.csv", "varcomp.csv", "vcov.mtx"}));
  EXPECT_EQ(content(inner + "/predicted.csv"), "row,predicted\n1,1.5\n2,\n");
  // The next fit has neither predictions nor covariances: the earlier ones must not pass for its own.
  e.fit.predicted.clear();
  e.fit.vcov_fixef.clear();
  e.fit.criterion = 49.0;
  write_fit(inner, e.model, e.fit);
  EXPECT_EQ(names_in(inner), (Strings{"fit.json", "fitted.csv", "fixef.csv", "ranef.csv", "varcomp.csv"}));
  EXPECT_EQ(nlohmann::json::parse(content(inner + "/fit.json"))["criterion"], 49.0);
}

}  // namespace
}  // namespace sm::mixed::test
