#include <gtest/gtest.h>

#include <cmath>
#include <cstdio>
#include <limits>

#include "bench/cases.hpp"
#include "bench/generators/generators.hpp"
#include "bench/harness/latency.hpp"
#include "bench/harness/steps.hpp"
#include "bench/harness/workbench.hpp"
#include "bench/phases/phases.hpp"

namespace sm::bench::test {
namespace {

constexpr double kNan = std::numeric_limits<double>::quiet_NaN();

Contestant contestant(std::string name, double seconds, std::string fault = "") {
  return {std::move(name), [seconds] { return seconds; }, [fault = std::move(fault)] { return fault; }};
}

TEST(Race, long_jobs_are_run_less_often) {
  Forecast forecast(1e9);
  const auto outcomes =
      run_race({.job = "x", .n = 1.0, .rounds = 5},
               {contestant("short", 1.0), contestant("long", 5.0), contestant("longer", 50.0)}, forecast);
  EXPECT_EQ(outcomes[0].seconds.size(), 5u);
  EXPECT_EQ(outcomes[1].seconds.size(), 3u);
  EXPECT_EQ(outcomes[2].seconds.size(), 1u);
}

TEST(Race, one_wrong_result_takes_the_times_away) {
  Forecast forecast(1e9);
  int run = 0;
  const Contestant sometimes{"sometimes", [&] { return 1.0; }, [&] { return ++run == 2 ? "once wrong" : ""; }};
  const auto outcomes = run_race({.job = "x", .n = 1.0, .rounds = 4}, {sometimes}, forecast);
  EXPECT_EQ(outcomes[0].fault, "once wrong");
  EXPECT_FALSE(outcomes[0].counts());
}

TEST(Race, a_job_that_smaller_sizes_foretell_to_be_too_long_is_left_out) {
  Forecast forecast(100.0);
  const auto race = [&](double n, double seconds) {
    return run_race({.job = "x", .n = n, .rounds = 1}, {contestant("a", seconds)}, forecast)[0];
  };
  EXPECT_TRUE(race(10.0, 0.5).counts());
  EXPECT_TRUE(race(100.0, 5.0).counts());  // linear
  EXPECT_TRUE(race(1000.0, 50.0).counts());
  EXPECT_FALSE(race(10000.0, 0.0).counts());
}

TEST(Race, the_median_of_an_even_number_is_between_the_two) {
  Outcome outcome;
  outcome.seconds = {4.0, 1.0, 3.0, 2.0};
  EXPECT_EQ(outcome.median(), 2.5);
}

TEST(Steps, each_has_the_median_of_its_runs_in_the_order_of_the_first) {
  Steps steps;
  const auto nothing = [] {};
  const double late = steps.time("z", nothing);
  double volatile sum = 0.0;  // volatile: it is work
  const double early = steps.time("a", [&] {
    for (int k = 0; k < 100000; ++k) sum = sum + 1.0;
  });
  const Json medians = steps.medians();
  EXPECT_EQ(medians.dump(), (Json{{"z", late}, {"a", early}}).dump());
  EXPECT_GT(early, 0.0);
  const double second = steps.time("a", nothing);
  EXPECT_EQ(steps.medians()["a"].get<double>(), 0.5 * (early + second));
}

TEST(Latency, the_chase_comes_by_every_place_before_it_is_back) {
  for (const std::uint32_t count : {1u, 2u, 3u, 1000u}) {
    const std::vector<std::uint32_t> next = random_cycle(count);
    std::uint32_t at = 0, steps = 0;
    do {
      at = next[at];
      ++steps;
    } while (at != 0 && steps <= count);
    EXPECT_EQ(steps, count);
  }
}

TEST(Latency, a_load_takes_time) {
  const double seconds = dependent_load(std::size_t{1} << 20);
  EXPECT_GT(seconds, 1e-10);
  EXPECT_LT(seconds, 1e-5);
}

TEST(Latency, an_addition_to_a_scattered_place_takes_time) {
  const double seconds = scattered_addition(std::size_t{1} << 18);
  EXPECT_GT(seconds, 1e-11);
  EXPECT_LT(seconds, 1e-6);
}

TEST(Workbench, rows_that_share_the_end_of_their_subscripts_keep_it_once) {
  const std::string file = testing::TempDir() + "bench_subscripts.jsonl";
  Module module;
  Records records(file);
  Forecast forecast(60.0);
  Problem apart{.family = "x", .name = "apart", .n = 4, .rank = 4, .upper = {}, .rhs = {}};
  for (int i = 0; i < 4; ++i) apart.upper.add(i, i, 9.0);
  // All joined: the first row's subscripts hold those of the others.
  Problem joined = apart;
  for (int i = 0; i < 4; ++i) {
    for (int j = i + 1; j < 4; ++j) joined.upper.add(i, j, -1.0);
  }
  Workbench none(module, apart, records, forecast, 1), all(module, joined, records, forecast, 1);
  EXPECT_EQ(kept_subscripts(*none.factored()), 0.0);
  EXPECT_EQ(kept_subscripts(*all.factored()), 3.0);
  std::remove(file.c_str());
}

TEST(Checks, a_wrong_solution_is_a_fault_and_so_is_a_nan) {
  const Problem p = plane_grid(6);
  const UpperRows rows = compress(p);
  const std::vector<double> x(36, 1.0), b = multiply(rows, x.data());
  EXPECT_EQ(solution_fault(rows, x.data(), b), "");
  std::vector<double> wrong = x;
  wrong[35] += 1e-9;
  EXPECT_NE(solution_fault(rows, wrong.data(), b), "");
  wrong[35] = kNan;
  EXPECT_NE(solution_fault(rows, wrong.data(), b), "");
}

TEST(Checks, a_number_that_is_off_is_a_fault_and_so_is_a_nan) {
  EXPECT_EQ(number_fault("x", 1.0 + 1e-12, 1.0, 0.0, 1e-10), "");
  EXPECT_NE(number_fault("x", 1.0 + 1e-9, 1.0, 0.0, 1e-10), "");
  EXPECT_NE(number_fault("x", kNan, 1.0, 0.0, 1e-10), "");
  EXPECT_NE(number_fault("x", 1.0, kNan, 0.0, 1e-10), "");
}

TEST(Checks, every_phase_refuses_the_results_of_another_system) {
  // A workbench whose right-hand side and rank belong to a matrix that is not the one it holds.
  const std::string file = testing::TempDir() + "bench_faults.jsonl";
  Module module;
  Records records(file);
  Forecast forecast(60.0);
  Problem p = plane_grid(5);
  p.rhs[3] = kNan;
  Workbench bench(module, p, records, forecast, 1);
  measure_total(bench);
  const int in_total = records.faults();
  EXPECT_GT(in_total, 1);
  measure_solves(bench);
  EXPECT_GT(records.faults(), in_total);
  std::remove(file.c_str());
}

TEST(Cases, sizes_grow_within_a_family) {
  for (const Size size : {Size::quick, Size::moderate}) {
    std::map<std::string, double> last;
    for (const Case& c : cases_of(size)) {
      if (c.family == "c" || c.family == "hubs") continue;  // each goes through its sizes twice or more
      const double n = c.make().n;
      EXPECT_GT(n, last[c.family]) << c.family;
      last[c.family] = n;
    }
  }
}

}  // namespace
}  // namespace sm::bench::test
