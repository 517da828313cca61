// qxsm: information about, factorization of and solutions with sparse symmetric matrices, by way of the module.
#include <fmt/format.h>
#include <unistd.h>

#include <csignal>
#include <new>
#include <stdexcept>

#include "cli/options.hpp"

namespace sm::cli {
namespace {

// Whether the result itself goes to standard output, so that the report has to go elsewhere.
bool output_is_taken(const Options& options) {
  return (options.command == Command::solve && options.solve.output == "-") ||
         (options.command == Command::invdiag && options.invdiag.output == "-") ||
         (options.command == Command::grid && options.grid.output == "-");
}

Report run_command(const Options& options) {
  // On a terminal, a result that goes there and a progress line would run into each other.
  const bool shown = !options.common.quiet && !output_is_taken(options) && is_capable_terminal(STDERR_FILENO);
  Progress progress(STDERR_FILENO, shown);
  switch (options.command) {
    case Command::info:
      return run_info(options.info, options.common, progress);
    case Command::factor:
      return run_factor(options.factor, options.common, progress);
    case Command::solve:
      return run_solve(options.solve, options.common, progress);
    case Command::invdiag:
      return run_invdiag(options.invdiag, options.common, progress);
    case Command::grid:
      return run_grid(options.grid);
    case Command::none:
      break;
  }
  throw CommandError({.what = "no subcommand was given", .advice = "see qxsm --help"});
}

ExitCode print(const Options& options, const Report& report) {
  const bool taken = output_is_taken(options);
  if (taken && options.command == Command::grid) return report.code();  // there is nothing to say beside the grid
  const int file = taken ? STDERR_FILENO : STDOUT_FILENO;
  const std::string text = options.common.json ? report.json() : options.common.quiet ? "" : report.text();
  write_all(file, text, taken ? "standard error" : "standard output");
  if (!report.failure().empty()) write_all(STDERR_FILENO, "qxsm: " + report.failure() + "\n", "standard error");
  return report.code();
}

ExitCode run(int argc, const char* const* argv) {
  const Options options = parse_options(argc, argv);
  if (!options.answer.empty()) {
    write_all(STDOUT_FILENO, options.answer, "standard output");
    return ExitCode::fine;
  }
  if (options.common.json && output_is_taken(options)) {
    throw CommandError({.what = "--json and -o - both want standard output", .advice = "give -o a file"});
  }
  return print(options, run_command(options));
}

// The last words. They may meet the same closed pipe that they are about; the exit code then has to do.
ExitCode explain(const Problem& problem, bool json) {
  try {
    write_all(STDERR_FILENO, "qxsm: " + describe(problem) + "\n", "standard error");
  } catch (const CommandError&) {
  }
  try {
    if (json) write_all(STDOUT_FILENO, json_text(Json{{"error", error_object(problem)}}), "standard output");
  } catch (const CommandError&) {
  }
  return problem.code;
}

}  // namespace

int run_guarded(int argc, const char* const* argv) {
  // A reader that goes away is then an error of write(), with a message, and not a silent death.
  std::signal(SIGPIPE, SIG_IGN);
  const bool json = wants_json(argc, argv);
  const Problem no_memory{.code = ExitCode::no_memory,
                          .what = "out of memory",
                          .advice = "end other programs, or use a machine with more memory"};
  try {
    return static_cast<int>(run(argc, argv));
  } catch (const CommandError& error) {
    return static_cast<int>(explain(error.problem(), json));
  } catch (const std::bad_alloc&) {
    return static_cast<int>(explain(no_memory, json));
  } catch (const std::length_error&) {
    return static_cast<int>(explain(no_memory, json));
  }
}

}  // namespace sm::cli

int main(int argc, char** argv) { return sm::cli::run_guarded(argc, argv); }
