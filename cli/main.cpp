// qxsm: the operations of the module on matrices in files.
#include <fmt/core.h>
#include <malloc.h>
#include <unistd.h>

#include <csignal>
#include <new>
#include <stdexcept>

#include "cli/model_error.hpp"
#include "cli/options.hpp"

namespace sm::cli {
namespace {

Report run_command(const Options& options) {
  // On a terminal, a result that goes there and a progress line would run into each other.
  const bool shown = !options.common.quiet && !options.output_is_taken() && is_capable_terminal(STDERR_FILENO);
  Progress progress(STDERR_FILENO, shown);
  return options.run(options, progress);
}

ExitCode print(const Options& options, const Report& report) {
  const bool taken = options.output_is_taken();
  const int file = taken ? STDERR_FILENO : STDOUT_FILENO;
  const bool silent = options.common.quiet || (taken && options.filter);
  const std::string text = options.common.json ? report.json() : silent ? "" : report.text();
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
  if (options.common.json && options.output_is_taken()) {
    throw CommandError(
        {.what = "--json and the result both want standard output", .advice = "send the result to a file"});
  }
  return print(options, run_command(options));
}

// The last words. They may meet the same closed pipe that they are about; the exit code then has to do.
ExitCode explain(ExitCode code, const std::string& text, const Json& error, bool json) {
  try {
    write_all(STDERR_FILENO, "qxsm: " + text + "\n", "standard error");
  } catch (const CommandError&) {
  }
  try {
    if (json) write_all(STDOUT_FILENO, json_text(Json{{"error", error}}), "standard output");
  } catch (const CommandError&) {
  }
  return code;
}

ExitCode explain(const Problem& problem, bool json) {
  return explain(problem.code, describe(problem), error_object(problem), json);
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
  } catch (const mixed::ModelError& error) {
    return static_cast<int>(explain(exit_code_of(error), error.what(), error_object(error), json));
  } catch (const std::bad_alloc&) {
    return static_cast<int>(explain(no_memory, json));
  } catch (const std::length_error&) {
    return static_cast<int>(explain(no_memory, json));
  }
}

}  // namespace sm::cli

int main(int argc, char** argv) {
#ifdef __GLIBC__
  // Vectors of a fit come and go with each evaluation: given back to the system, their pages would be cleared each time.
  mallopt(M_MMAP_THRESHOLD, 32 << 20);
  mallopt(M_TRIM_THRESHOLD, 256 << 20);
#endif
  return sm::cli::run_guarded(argc, argv);
}
