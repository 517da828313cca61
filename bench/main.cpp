// The benchmark: one process, one thread, the module and its peers in turns. bench/run builds and starts it.
#include <unistd.h>

#include <CLI/CLI.hpp>
#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <map>
#include <optional>

#include "bench/cases.hpp"
#include "bench/generators/matrix_file.hpp"
#include "bench/harness/clock.hpp"
#include "bench/harness/memory.hpp"
#include "bench/machine.hpp"
#include "bench/peers/lapack.hpp"
#include "bench/phases/phases.hpp"

namespace sm::bench {
namespace {

struct Options {
  Size size = Size::full;
  Clock clock = Clock::cpu;
  std::vector<std::string> families, phases, matrices;
  std::string output = "results.jsonl";
  int rounds = 5;
  double longest = 120.0;
};

bool wanted(const std::vector<std::string>& list, std::string_view name) {
  return list.empty() || std::find(list.begin(), list.end(), name) != list.end();
}

bool wanted(const Options& options, const Case& c, const Phase& phase) {
  return std::any_of(phase.names.begin(), phase.names.end(),
                     [&](std::string_view name) { return wanted(options.phases, name) && wanted(c.phases, name); });
}

// The matrices of the command line take the place of the families unless these are asked for too.
std::vector<Case> all_cases(const Options& options) {
  std::vector<Case> cases;
  if (options.matrices.empty() || !options.families.empty()) cases = cases_of(options.size);
  std::erase_if(cases, [&](const Case& c) { return !wanted(options.families, c.family); });
  for (const std::string& file : options.matrices) {
    cases.push_back({"file", [file] { return read_matrix(file); }, {}});
  }
  return cases;
}

void run_cases(const Options& options, Module& module, Records& records) {
  Forecast forecast(options.longest);
  for (const Case& c : all_cases(options)) {
    std::optional<Workbench> bench;  // made for the first phase that is wanted
    for (const Phase& phase : phases()) {
      if (!wanted(options, c, phase)) continue;
      if (!bench) bench.emplace(module, c.make(), records, forecast, options.rounds);
      phase.run(*bench);
    }
  }
  if (!options.matrices.empty() && options.families.empty()) return;
  if (!wanted(options.families, "dense") || !wanted(options.phases, "dense")) return;
  for (const int n : dense_orders(options.size)) measure_dense(module, records, n, options.rounds);
}

int run(const Options& options) {
  chosen_clock() = options.clock;
  use_one_thread();
  keep_freed_memory();
  Module module;
  Records records(options.output);
  records.write(describe_machine(module.file(), options.clock));
  run_cases(options, module, records);
  if (records.faults() == 0) return 0;
  std::fprintf(stderr, "%d results were wrong\n", records.faults());
  return 1;
}

int main_of(int argc, char** argv) {
  CLI::App app("Times the module beside its peers, checks every result, writes one JSON object a line.");
  Options options;
  const std::map<std::string, Size> sizes = {
      {"quick", Size::quick}, {"moderate", Size::moderate}, {"full", Size::full}};
  const std::map<std::string, Clock> clocks = {{"cpu", Clock::cpu}, {"wall", Clock::wall}};
  app.add_option("--size", options.size, "quick, moderate or full")->transform(CLI::CheckedTransformer(sizes));
  app.add_flag_callback(
      "--quick", [&] { options.size = Size::quick; }, "The same as --size quick");
  app.add_option("--family", options.families, "a, b, c, d, e, f, arrow, crossed, hubs, row, dense; default all")
      ->delimiter(',');
  app.add_option("--phase", options.phases,
                 "assembly, closing, ordering, symbolic, numeric, total, solve, inverse, trace, refactor, product, "
                 "iteration, memory, rank, dense; default all")
      ->delimiter(',');
  app.add_option("--matrix", options.matrices, "Matrix Market files, symmetric, instead of the families")
      ->delimiter(',');
  app.add_option("--rounds", options.rounds, "Runs of everybody; fewer where one takes long")
      ->check(CLI::Range(1, 100));
  app.add_option("--longest", options.longest, "Seconds; a job that is expected to take longer is left out");
  app.add_option("--clock", options.clock, "cpu or wall")->transform(CLI::CheckedTransformer(clocks));
  app.add_option("-o,--output", options.output, "The file of results");
  CLI11_PARSE(app, argc, argv);
  return run(options);
}

// Libraries read their settings when they are loaded, so these must be there before the process starts. What the
// environment says about OpenBLAS goes: the peers get the kernels that the library itself takes for this processor.
void start_again_with_settings(char** argv) {
  if (std::getenv("QXBENCH_STARTED")) return;
  for (const char* name : {"OPENBLAS_CORETYPE", "OPENBLAS_L2_SIZE", "OPENBLAS_VERBOSE"}) unsetenv(name);
  if (const char* kernels = std::getenv("QXBENCH_KERNELS")) setenv("OPENBLAS_CORETYPE", kernels, 1);
  setenv("OPENBLAS_NUM_THREADS", "1", 1);
  setenv("OMP_NUM_THREADS", "1", 1);
  setenv("QXBENCH_STARTED", "1", 1);
  execv(std::filesystem::read_symlink("/proc/self/exe").c_str(), argv);
}

}  // namespace
}  // namespace sm::bench

int main(int argc, char** argv) {
  try {
    sm::bench::start_again_with_settings(argv);
    return sm::bench::main_of(argc, argv);
  } catch (const std::exception& e) {
    std::fprintf(stderr, "qxbench: %s\n", e.what());
    return 2;
  }
}
