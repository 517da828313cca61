// Fits of mixed models as a user asks for them: answers, files, and the ways to go wrong.
#include <fcntl.h>
#include <pty.h>
#include <signal.h>
#include <unistd.h>

#include <array>
#include <cmath>
#include <filesystem>
#include <fstream>
#include <map>
#include <nlohmann/json.hpp>
#include <random>
#include <sstream>

#include "cli/command.hpp"

namespace sm::test {
namespace {

using nlohmann::json;

// Lists of lists are looked into at every depth here.
json parsed(const Outcome& run) { return json::parse(run.out); }

class ModelCommand : public CommandTest {
 protected:
  static std::vector<std::string> with(std::vector<std::string> arguments, const std::vector<std::string>& more) {
    arguments.insert(arguments.end(), more.begin(), more.end());
    return arguments;
  }
  static std::vector<std::string> sleep(const std::vector<std::string>& more) {
    return with({"lmm", example("sleepstudy.csv"), "reaction ~ days + (days | subject)"}, more);
  }
  static std::vector<std::string> calves(const std::vector<std::string>& more) {
    return with({"blup", example("calves.csv"), "gain ~ 0 + sex + (1 | calf; pedigree)", "--pedigree",
                 example("calves_pedigree.csv"), "--var", "calf=20", "--var", "residual=40"},
                more);
  }
  // A message that may go on with the formula, and a mark below the place in it.
  static void expect_fault(const Outcome& run, const std::vector<std::string>& parts) {
    EXPECT_EQ(run.code, 2) << run.err;
    EXPECT_EQ(run.out, "");
    EXPECT_EQ(run.err.rfind("qxsm: ", 0), 0u) << run.err;
    for (const std::string& part : parts) {
      EXPECT_NE(run.err.find(part), std::string::npos) << part << " in " << run.err;
    }
  }
  // Groups crossed at random, large enough for a fit to take a while.
  std::string crossed(int rows, int first, int second) const {
    std::mt19937 random(7);
    std::normal_distribution<double> normal;
    std::ostringstream text;
    text << "y,g,h\n";
    for (int i = 0; i < rows; ++i) {
      const auto g = static_cast<int>(random() % static_cast<unsigned>(first));
      const auto h = static_cast<int>(random() % static_cast<unsigned>(second));
      text << std::sin(g) + std::cos(7.0 * h) + normal(random) << ',' << g << ',' << h << '\n';
    }
    return file("crossed.csv", text.str());
  }
};

// Sums of squares of a balanced one-way layout in a file of two columns, group and response.
struct OneWay {
  double between = 0.0;  // mean squares
  double within = 0.0;
  double mean = 0.0;
  double groups = 0.0;
  double each = 0.0;

  explicit OneWay(const std::string& text) {
    std::map<std::string, std::vector<double>> values;
    std::istringstream lines(text);
    std::string line;
    std::getline(lines, line);
    double n = 0.0;
    while (std::getline(lines, line)) {
      const std::size_t comma = line.find(',');
      values[line.substr(0, comma)].push_back(std::stod(line.substr(comma + 1)));
      mean += values[line.substr(0, comma)].back();
      n += 1.0;
    }
    mean /= n;
    groups = static_cast<double>(values.size());
    each = n / groups;
    for (const auto& [group, list] : values) {
      double sum = 0.0;
      for (const double v : list) sum += v;
      for (const double v : list) within += (v - sum / each) * (v - sum / each);
      between += each * (sum / each - mean) * (sum / each - mean);
    }
    between /= groups - 1.0;
    within /= n - groups;
  }
};

TEST_F(ModelCommand, agrees_with_the_analysis_of_variance_of_balanced_data) {
  for (const auto& [name, formula] : std::map<std::string, std::string>{{"dyestuff.csv", "yield ~ 1 + (1 | batch)"},
                                                                        {"rail.csv", "travel ~ 1 + (1 | rail)"}}) {
    const OneWay anova(read(example(name)));
    const Outcome run = qxsm({"lmm", example(name), formula, "--json"});
    ASSERT_EQ(run.code, 0) << run.err;
    const json fit = parsed(run);
    EXPECT_EQ(fit.at("convergence"), "converged");
    const double variance = (anova.between - anova.within) / anova.each;
    EXPECT_NEAR(fit.at("varcomp").at(0).at("vcov").get<double>() / variance, 1.0, 1e-8) << name;
    EXPECT_NEAR(fit.at("varcomp").at(1).at("vcov").get<double>() / anova.within, 1.0, 1e-8) << name;
    const json& mean = fit.at("fixef").at(0);
    EXPECT_NEAR(mean.at("estimate").get<double>(), anova.mean, 1e-9 * anova.mean);
    const double n = anova.groups * anova.each;
    EXPECT_NEAR(mean.at("se").get<double>() / std::sqrt(anova.between / n), 1.0, 1e-8);
    EXPECT_NEAR(mean.at("df_satterthwaite").get<double>(), anova.groups - 1.0, 1e-6);
  }
}

TEST_F(ModelCommand, is_least_squares_without_random_terms) {
  // Slope 1 and intercept 1.5 by the normal equations; residuals -0.5, 0.5, 0.5, -0.5.
  const std::string data = file("l.csv", "y,x\n2,1\n4,2\n5,3\n5,4\n");
  for (const bool ml : {false, true}) {
    const Outcome run = qxsm(
        with({"lmm", data, "y ~ x", "--json"}, ml ? std::vector<std::string>{"--ml"} : std::vector<std::string>{}));
    ASSERT_EQ(run.code, 0) << run.err;
    const json fit = parsed(run);
    EXPECT_NEAR(fit.at("fixef").at(0).at("estimate").get<double>(), 1.5, 1e-12);
    EXPECT_NEAR(fit.at("fixef").at(1).at("estimate").get<double>(), 1.0, 1e-12);
    EXPECT_NEAR(fit.at("varcomp").at(0).at("vcov").get<double>(), 1.0 / (ml ? 4.0 : 2.0) * 1.0, 1e-12);
    EXPECT_EQ(fit.at("singular"), false);
  }
}

TEST_F(ModelCommand, says_in_words_that_a_variance_is_zero) {
  const std::string data = file("b.csv", "g,y\na,1\na,5\nb,2\nb,4.5\nc,5.2\nc,0.8\n");
  const OneWay anova(read(data));
  ASSERT_LT(anova.between, anova.within);
  const Outcome run = qxsm({"lmm", data, "y ~ 1 + (1 | g)"});
  ASSERT_EQ(run.code, 0) << run.err;
  EXPECT_NE(run.out.find("the estimate for 'g' is on the boundary: its variance is zero"), std::string::npos)
      << run.out;
  const json fit = parsed(qxsm({"lmm", data, "y ~ 1 + (1 | g)", "--json"}));
  EXPECT_EQ(fit.at("singular"), true);
  EXPECT_EQ(fit.at("varcomp").at(0).at("vcov"), 0.0);
  const double total = (anova.between * 2.0 + anova.within * 3.0) / 5.0;
  EXPECT_NEAR(fit.at("varcomp").at(1).at("vcov").get<double>(), total, 1e-9);
}

// Mrode (2005), example 3.1, as printed.
TEST_F(ModelCommand, predicts_what_a_textbook_says) {
  const json fit = parsed(qxsm(calves({"--json"})));
  const std::map<std::string, double> printed{{"1", 0.098},  {"2", -0.019}, {"3", -0.041}, {"4", -0.009},
                                              {"5", -0.186}, {"6", 0.177},  {"7", -0.249}, {"8", 0.183}};
  const json& effects = fit.at("ranef").at(0);
  ASSERT_EQ(effects.at("levels").size(), printed.size());
  for (std::size_t i = 0; i < printed.size(); ++i) {
    EXPECT_NEAR(effects.at("estimate").at(i).get<double>(), printed.at(effects.at("levels").at(i)), 6e-4);
  }
  const std::map<std::string, double> sexes{{"sexmale", 4.358}, {"sexfemale", 3.404}};
  for (const json& effect : fit.at("fixef")) {
    EXPECT_NEAR(effect.at("estimate").get<double>(), sexes.at(effect.at("name")), 6e-4);
  }
  const Outcome text = qxsm(calves({"--pev"}));
  EXPECT_EQ(text.code, 0);
  EXPECT_NE(text.out.find("Random effects of calf"), std::string::npos);
  EXPECT_NE(text.out.find("reliability"), std::string::npos);
}

TEST_F(ModelCommand, given_variances_may_be_a_covariance_matrix) {
  const json fit = parsed(qxsm(sleep({"--json"})));
  std::string matrix = "subject=";
  for (int i = 0; i < 3; ++i) matrix += (i ? "," : "") + fit.at("varcomp").at(i).at("vcov").dump();
  const Outcome run = qxsm({"blup", example("sleepstudy.csv"), "reaction ~ days + (days | subject)", "--var", matrix,
                            "--var", "residual=" + fit.at("varcomp").at(3).at("vcov").dump(), "--json"});
  ASSERT_EQ(run.code, 0) << run.err;
  EXPECT_NEAR(parsed(run).at("criterion").get<double>(), fit.at("criterion").get<double>(), 1e-8);
  const double ours = parsed(run).at("ranef").at(1).at("estimate").at(3).get<double>();
  EXPECT_NEAR(ours, fit.at("ranef").at(1).at("estimate").at(3).get<double>(), 1e-7);
  for (const char* wrong : {"subject=600,10", "subject=600", "subject=-600,10,35", "days=3"}) {
    EXPECT_EQ(qxsm({"blup", example("sleepstudy.csv"), "reaction ~ days + (days | subject)", "--var", wrong, "--var",
                    "residual=600"})
                  .code,
              2)
        << wrong;
  }
}

TEST_F(ModelCommand, names_what_depends_on_other_columns_and_refuses_numbers_that_do_not_exist) {
  const std::string data = file("a.csv",
                                "y,x,f,g\n1.0,1,a,p\n2.1,2,b,p\n2.9,3,c,q\n1.4,1,a,q\n2.2,2,b,r\n3.3,3,c,r\n"
                                "0.8,1,a,s\n2.0,2,b,s\n");
  const std::vector<std::string> line{"lmm",        data,     "y ~ x + f + (1 | g)", "--test",
                                      "slope: 1*x", "--test", "c - a: 2*x + 1*f[c]"};
  const json fit = parsed(qxsm(with(line, {"--json"})));
  ASSERT_EQ(fit.at("aliased").size(), 1u);
  EXPECT_EQ(fit.at("aliased").at(0).at("name"), "fc");
  EXPECT_EQ(fit.at("contrasts").at(0).at("estimable"), false);
  EXPECT_TRUE(fit.at("contrasts").at(0).at("estimate").is_null());
  EXPECT_EQ(fit.at("contrasts").at(1).at("estimable"), true);
  EXPECT_TRUE(fit.at("contrasts").at(1).at("estimate").is_number());
  const Outcome text = qxsm(line);
  EXPECT_EQ(text.code, 0);
  EXPECT_NE(text.out.find("not estimable"), std::string::npos) << text.out;
}

TEST_F(ModelCommand, writes_tables_pictures_and_a_fit_to_start_from) {
  const Outcome run = qxsm(sleep({"--out", path("fit"), "--plot", path("plots"), "--json"}));
  ASSERT_EQ(run.code, 0) << run.err;
  for (const char* name : {"fixef.csv", "ranef.csv", "varcomp.csv", "vcov.mtx", "fitted.csv", "fit.json"}) {
    EXPECT_TRUE(std::filesystem::exists(path("fit") + "/" + name)) << name;
  }
  for (const char* name : {"caterpillar.svg", "residuals.svg", "qq.svg", "criterion.svg", "spy.svg"}) {
    EXPECT_EQ(read(path("plots") + "/" + name).find("<"), 0u) << name;
  }
  const json fit = parsed(run);
  EXPECT_EQ(json::parse(read(path("fit") + "/fit.json")).at("criterion"), fit.at("criterion"));
  const Outcome again = qxsm(sleep({"--start", path("fit") + "/fit.json", "--json"}));
  ASSERT_EQ(again.code, 0) << again.err;
  EXPECT_NEAR(parsed(again).at("criterion").get<double>(), fit.at("criterion").get<double>(), 1e-9);
  EXPECT_LT(parsed(again).at("iterations").size(), fit.at("iterations").size());
}

TEST_F(ModelCommand, predicts_new_rows_by_fixed_and_random_effects) {
  const std::string rows = file("new.csv", "days,subject\n0,308\n4,308\n4,nobody\n,308\n");
  const Outcome run = qxsm(sleep({"--predict", rows, "--out", path("fit"), "--json"}));
  ASSERT_EQ(run.code, 0) << run.err;
  const json fit = parsed(run);
  const auto fixed = [&](std::size_t i) { return fit.at("fixef").at(i).at("estimate").get<double>(); };
  const auto random = [&](std::size_t i) { return fit.at("ranef").at(i).at("estimate").at(0).get<double>(); };
  ASSERT_EQ(fit.at("ranef").at(0).at("levels").at(0), "308");
  std::istringstream lines(read(path("fit") + "/predicted.csv"));
  std::vector<std::string> fields;
  for (std::string line; std::getline(lines, line);) fields.push_back(line.substr(line.find(',') + 1));
  ASSERT_EQ(fields.size(), 5u);
  EXPECT_NEAR(std::stod(fields[1]), fixed(0) + random(0), 1e-9);
  EXPECT_NEAR(std::stod(fields[2]), fixed(0) + random(0) + 4.0 * (fixed(1) + random(1)), 1e-9);
  EXPECT_NEAR(std::stod(fields[3]), fixed(0) + 4.0 * fixed(1), 1e-9);
  EXPECT_EQ(fields[4], "");
  EXPECT_NE(run.out.find("predicted with a random effect of 0"), std::string::npos);
}

TEST_F(ModelCommand, reads_standard_input_and_factors_of_integers) {
  const Outcome run = qxsm({"lmm", "-", "reaction ~ days + (1 | subject)", "--factor", "days", "--levels",
                            "days=9,0,1,2,3,4,5,6,7,8", "--json"},
                           {.input = read(example("sleepstudy.csv"))});
  ASSERT_EQ(run.code, 0) << run.err;
  EXPECT_EQ(parsed(run).at("fixed_columns").size(), 10u);
  EXPECT_EQ(parsed(run).at("fixed_columns").at(1), "days0");
}

TEST_F(ModelCommand, a_dry_run_tells_the_size_and_stops) {
  const json plan = parsed(qxsm(sleep({"--dry-run", "--json", "--out", path("none")})));
  EXPECT_EQ(plan.at("order"), 38);
  EXPECT_EQ(plan.at("observations"), 180);
  EXPECT_GT(plan.at("flops"), 0.0);
  EXPECT_GT(plan.at("bytes"), 0.0);
  EXPECT_FALSE(std::filesystem::exists(path("none")));
}

TEST_F(ModelCommand, a_dry_run_foretells_the_memory_that_a_fit_takes) {
  if (sanitized()) GTEST_SKIP() << "a sanitizer's own memory is another matter";
  const std::vector<std::vector<std::string>> lines{sleep({}),
                                                    {"lmm", crossed(20000, 1500, 600), "y ~ 1 + (1 | g) + (1 | h)"},
                                                    {"lmm", crossed(60000, 8000, 12), "y ~ 1 + (1 | g) + (1 | h)"}};
  for (const std::vector<std::string>& line : lines) {
    const double bytes = parsed(qxsm(with(line, {"--dry-run", "--json"}))).at("bytes");
    const Outcome run = qxsm(with(line, {"--json"}));
    const double peak = parsed(run).at("peak_bytes");
    EXPECT_GT(peak, 0.5 * bytes) << line[2];
    EXPECT_LT(peak, 1.5 * bytes) << line[2];
  }
}

TEST_F(ModelCommand, a_fit_that_is_too_large_is_not_begun) {
  const std::string data = crossed(20000, 2000, 800);
  const std::vector<std::string> line{"lmm", data, "y ~ 1 + (1 | g) + (1 | h)"};
  const double bytes = parsed(qxsm(with(line, {"--dry-run", "--json"}))).at("bytes");
  const Outcome run = qxsm(with(line, {"--memory", std::to_string(static_cast<long>(0.9 * bytes))}));
  expect_message(run, 3, {"the fit would take about ", "MiB of --memory", "; raise --memory"});
  EXPECT_EQ(qxsm(with(line, {"--memory", "10K"})).code, 3);
  EXPECT_EQ(run.out, "");
}

TEST_F(ModelCommand, ctrl_c_keeps_what_there_is_and_start_goes_on) {
  const std::string data = crossed(30000, 3000, 1500);
  const std::string formula = "y ~ 1 + (1 | g) + (1 | h)";
  int terminal = -1;
  int program_side = -1;
  ASSERT_EQ(openpty(&terminal, &program_side, nullptr, nullptr, nullptr), 0);
  std::string screen;
  const auto user = [&](int process) {
    std::array<char, 4096> buffer{};
    while (screen.find("  0  criterion ") == std::string::npos) {
      const ssize_t got = ::read(terminal, buffer.data(), buffer.size());
      if (got <= 0) return;
      screen.append(buffer.data(), static_cast<std::size_t>(got));
    }
    kill(process, SIGINT);
  };
  const Outcome run = qxsm({"lmm", data, formula, "--out", path("fit")},
                           {.err_file = program_side, .terminal = "xterm", .beside = user});
  for (const int side : {terminal, program_side}) close(side);
  EXPECT_EQ(run.code, 1) << screen;
  EXPECT_NE(run.out.find("STOPPED"), std::string::npos) << run.out;
  const json stopped = json::parse(read(path("fit") + "/fit.json"));
  EXPECT_EQ(stopped.at("convergence"), "stopped");
  const Outcome on = qxsm({"lmm", data, formula, "--start", path("fit") + "/fit.json", "--json"});
  EXPECT_EQ(on.code, 0) << on.err;
  EXPECT_EQ(parsed(on).at("convergence"), "converged");
  EXPECT_LE(parsed(on).at("criterion").get<double>(), stopped.at("criterion").get<double>());
}

TEST_F(ModelCommand, mistakes_in_data_are_named_with_their_place) {
  std::string rows = "y,x,g\n";
  for (int i = 0; i < 40; ++i) {
    rows += std::to_string(i % 7) + "," + (i == 20 ? "\"3,5\"" : std::to_string(i)) + "," + (i % 4 < 2 ? "a\n" : "b\n");
  }
  expect_fault(qxsm({"lmm", file("c.csv", rows), "y ~ x + (1 | g)"}), {"c.csv:22:", "'x'", "3,5"});
  const std::string ragged = file("r.csv", "y,x,g\n1.5,1,a\n2.5,2\n");
  expect_fault(qxsm({"lmm", ragged, "y ~ x + (1 | g)"}), {"r.csv:3"});
  const std::string words = file("w.csv", "y,g\nlow,a\nhigh,a\nlow,b\nmid,b\n");
  expect_fault(qxsm({"lmm", words, "y ~ 1 + (1 | g)"}), {"'y'", "number"});
  const std::string one = file("o.csv", "y,g\n1,a\n2,a\n3,a\n4.5,a\n");
  expect_fault(qxsm({"lmm", one, "y ~ 1 + (1 | g)"}), {"'g'", "one level"});
  const std::string gap = file("m.csv", "y,g\n1,a\n2,a\nNA,b\n4.5,b\n3,b\n");
  expect_fault(qxsm({"lmm", gap, "y ~ 1 + (1 | g)", "--na", "fail"}), {"m.csv:4"});
  EXPECT_EQ(parsed(qxsm({"lmm", gap, "y ~ 1 + (1 | g)", "--json"})).at("rows_dropped"), 1);
  expect_fault(qxsm({"lmm", path("no.csv"), "y ~ 1 + (1 | g)"}), {"no.csv"});
}

TEST_F(ModelCommand, mistakes_in_formulas_and_options_are_named) {
  const auto line = [](const std::string& formula, const std::vector<std::string>& more) {
    return with({"lmm", example("sleepstudy.csv"), formula}, more);
  };
  expect_fault(qxsm(line("reaction ~ dais + (1 | subject)", {})), {"'dais'", "days"});
  expect_fault(qxsm(line("reaction ~ days + (1 | subject", {})), {"column "});
  expect_message(qxsm(line("reaction ~ days + (1 | subject; pedigree)", {})), 2, {"\"pedigree\"", "--pedigree P.csv"});
  expect_fault(qxsm(line("reaction ~ days + (1 | subject)", {"--pedigree", "p.csv"})),
               {"--pedigree is given", "(1 | g; pedigree)"});
  expect_fault(qxsm(line("reaction ~ days + (1 | subject)", {"--levels", "days"})), {"--levels", "\"days\""});
  expect_fault(qxsm(line("reaction ~ days + (1 | subject)", {"--test", "1*dais"})), {"dais"});
  EXPECT_NE(qxsm(line("reaction ~ days + (1 | subject)", {"--test", "-1*days"})).out.find("\n-1*days  -10.467"),
            std::string::npos);
  expect_fault(qxsm(line("", {})), {"formula: column 1: the formula is empty", "'y ~ x + (1 | g)'"});
  expect_fault(qxsm(line("~ days", {})), {"formula: column 1: there is no response before the tilde"});
  expect_message(qxsm(line("reaction ~ days + (1 | subject; K)", {})), 2, {"\"K\"", "--kinv K=K.mtx"});
  expect_fault(qxsm(line("log(reaction - 300) ~ days + (1 | subject)", {})),
               {"sleepstudy.csv:2:", "'log(reaction - 300)'", "the logarithm of a number that is not positive"});
  expect_fault(qxsm(line("reaction ~ days + (1 | subject)", {"--ratio", "x = subjekt / total"})), {"subjekt"});
  expect_fault(qxsm(line("reaction ~ days + (1 | subject)", {"--predict", "new.csv"})), {"--predict", "--out"});
  const std::string other = file("s.json", "{\"schema\": \"other/1\"}");
  expect_fault(qxsm(line("reaction ~ days + (1 | subject)", {"--start", other})), {"s.json", "qxsm-fit/1"});
  expect_fault(qxsm({"blup", example("rail.csv"), "travel ~ 1 + (1 | rail)", "--var", "residual=1"}),
               {"no variance is given for \"rail\"", "--var 'rail=...'"});
  const json error = parsed(qxsm(line("reaction ~ dais + (1 | subject)", {"--json"}))).at("error");
  EXPECT_EQ(error.at("exit_code"), 2);
  EXPECT_EQ(error.at("variable"), "dais");
  EXPECT_EQ(error.at("column"), 12);
}

TEST_F(ModelCommand, a_precision_that_is_none_is_a_numerical_no) {
  const std::string data = file("k.csv", "y,g\n1,1\n2,2\n4,3\n3,1\n2,2\n");
  const std::string bad = matrix("bad.mtx", "coordinate real symmetric", "3 3 4\n1 1 1\n2 2 1\n3 3 -2\n2 1 0.5\n");
  const Outcome run = qxsm({"reml", data, "y ~ 1 + (1 | g; k)", "--kinv", "k=" + bad});
  EXPECT_EQ(run.code, 1) << run.err;
  const std::string good = matrix("good.mtx", "coordinate real symmetric", "3 3 4\n1 1 1\n2 2 1\n3 3 2\n2 1 0.5\n");
  EXPECT_EQ(qxsm({"reml", data, "y ~ 1 + (1 | g; k)", "--kinv", "k=" + good, "--json"}).code, 0);
  expect_message(qxsm({"reml", data, "y ~ 1 + (1 | g; k)", "--kinv", "other=" + good}), 2,
                 {"--kinv other", "(1 | g; other)"});
}

}  // namespace
}  // namespace sm::test
