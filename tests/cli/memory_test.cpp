#include <filesystem>

#include "cli/command.hpp"

namespace sm::test {
namespace {

using Memory = CommandTest;

TEST_F(Memory, a_large_problem_under_a_small_ceiling_ends_with_3) {
  const std::string grid = path("grid.mtx");
  ASSERT_EQ(qxsm({"grid", "300", "300", "-o", grid}).code, 0);
  for (const char* command : {"factor", "solve"}) {
    const Outcome run = qxsm({command, grid, "--memory", "10M"});
    expect_message(run, 3,
                   {"out of memory while assembling the matrix: the ceiling of 10.0 MiB (--memory) was met",
                    "; raise --memory, or use a machine with more memory"});
    EXPECT_EQ(run.out, "");
  }
  const Outcome json = qxsm({"solve", grid, "--memory", "10M", "--json"});
  EXPECT_EQ(json.code, 3);
  EXPECT_EQ(json.json().at("error").at("exit_code"), 3);
  EXPECT_EQ(qxsm({"solve", grid, "--memory", "1G", "--quiet"}).code, 0);
}

// Every ceiling between "nothing works" and "all works" ends in an orderly way, whatever phase it hits.
TEST_F(Memory, every_ceiling_ends_with_3_or_0) {
  const auto peak = qxsm({"solve", shipped("nos3.mtx"), "--json"}).json().at("peak_pool_bytes").get<std::uint64_t>();
  int refused = 0;
  for (std::uint64_t step = 0; step < 24; ++step) {
    const std::uint64_t ceiling = 2048 + peak * step / 20;
    const Outcome run = qxsm({"solve", shipped("nos3.mtx"), "--memory", std::to_string(ceiling), "--json"});
    EXPECT_TRUE(run.code == 3 || run.code == 0) << ceiling << ": " << run.err;
    if (run.code == 0) {
      EXPECT_LE(run.json().at("peak_pool_bytes").get<std::uint64_t>(), ceiling);
      EXPECT_LT(run.json().at("largest_residual").get<double>(), 1e-14);
    }
    refused += run.code == 3 ? 1 : 0;
  }
  EXPECT_GE(refused, 10);
  EXPECT_LE(refused, 21);
}

// The same for what works on more than a factor.
TEST_F(Memory, every_subcommand_ends_with_3_under_some_ceilings_and_never_badly) {
  const std::string a = shipped("bcsstk01.mtx");
  const std::string x = scattered("x.mtx", 6, 48, false, 3);
  const std::vector<std::vector<std::string>> commands{{"quad", a, x},
                                                       {"quad", a, x, "--inverse"},
                                                       {"hermite", a},
                                                       {"estimable", a, x},
                                                       {"trace", a, "--inverse"},
                                                       {"solve", a, "--method", "cg", "--max-iterations", "500"},
                                                       {"convert", a, path("o.mtx"), "--to", "dense"}};
  for (const auto& command : commands) {
    std::vector<std::string> arguments = command;
    arguments.emplace_back("--json");
    const Outcome free = qxsm(arguments);
    ASSERT_EQ(free.code, 0) << command[0] << free.err;
    const auto peak = free.json().at("peak_pool_bytes").get<std::uint64_t>();
    int refused = 0;
    // Far below the peak: what is only quicker with memory does with less.
    for (const std::uint64_t part : {1, 2, 3, 4, 6, 8, 16, 32, 64, 128}) {
      std::vector<std::string> limited = command;
      limited.insert(limited.end(), {"--memory", std::to_string(peak / part), "--quiet"});
      const Outcome run = qxsm(limited);
      EXPECT_TRUE(run.code == 3 || run.code == 0) << command[0] << part << run.err;
      refused += run.code == 3 ? 1 : 0;
    }
    EXPECT_GE(refused, 3) << command[0];
  }
}

TEST_F(Memory, a_ceiling_that_does_not_let_the_module_in_ends_with_3) {
  expect_message(qxsm({"factor", shipped("bcsstk01.mtx"), "--memory", "100"}), 3, {"out of memory", "--memory", "; "});
}

TEST_F(Memory, rows_that_only_the_header_knows_of_end_with_3) {
  const std::string a =
      matrix("huge.mtx", "coordinate real symmetric", "4000000000000000000 4000000000000000000 1\n1 1 1\n");
  for (const char* command : {"info", "factor", "solve"}) {
    expect_message(qxsm({command, a}), 3,
                   {"out of memory: 4000000000000000000 rows with 1 entries need 27.8 EiB", "; check the sizes"});
  }
}

TEST_F(Memory, a_missing_module_ends_with_3_and_says_what_to_reinstall) {
  // A host library in a folder without the module, found before the one that the command was built with.
  std::filesystem::copy(QXSM_HOST_LIBRARY, path(std::filesystem::path(QXSM_HOST_LIBRARY).filename()));
  std::filesystem::copy(QXSM_HOST_LIBRARY, path("libqxhost.so.1"), std::filesystem::copy_options::skip_existing);
  const Outcome run = qxsm({"factor", shipped("bcsstk01.mtx")}, {.library_path = path("")});
  expect_message(run, 3, {"the module cannot be loaded (", "libqxesm.so", "; reinstall qxesm"});
}

}  // namespace
}  // namespace sm::test
