#include "cli/options.hpp"

#include <fmt/format.h>

#include <CLI/CLI.hpp>
#include <algorithm>
#include <string_view>

#include "cli/error.hpp"
#include "cli/fields.hpp"
#include "cli/format.hpp"
#include "cli/help.hpp"

namespace sm::cli {
namespace {

constexpr const char* kMatrixHelp = "Matrix Market file, plain or gzip;\n- is standard input";

std::string check_memory(const std::string& text) {
  if (parse_memory(text)) return {};
  return fmt::format("found {}, expected a number of bytes above 0 with an optional suffix K, M, G or T (4G)",
                     quote(text));
}

std::string check_method(const std::string& text) {
  if (text == "direct") return {};
  return fmt::format("found {}, expected direct", quote(text));
}

std::string check_count(const std::string& text) {
  std::int64_t value = 0;
  if (parse_index(text, value) && value > 0) return {};
  return fmt::format("found {}, expected a whole number above 0", quote(text));
}

std::string check_finite(const std::string& text) {
  double value = 0.0;
  if (parse_real(text, value)) return {};
  return fmt::format("found {}, expected a finite number", quote(text));
}

void add_common(CLI::App& command, CommonOptions& common) {
  command.add_flag("--json", common.json,
                   "Print one JSON object on standard output,\n"
                   "with the same facts; for errors too");
  command.add_flag("--quiet", common.quiet,
                   "Print nothing but errors, no progress either;\n"
                   "with --json, the object only");
}

void add_memory(CLI::App& command, CommonOptions& common) {
  command
      .add_option("--memory", common.memory,
                  "Ceiling for the memory pools of the computation,\n"
                  "and for what is kept of a file: 512M, 4G (K, M,\n"
                  "G, T are powers of 1024). Past it the run ends\n"
                  "with exit code 3. Default: what this machine has")
      ->check(CLI::Validator(check_memory, ""))
      ->type_name("SIZE");
}

// In the list of subcommands, the first line of a description stands for it.
class HelpFormatter : public CLI::Formatter {
 public:
  std::string make_subcommand(const CLI::App* command) const override {
    const std::string description = command->get_description();
    return fmt::format("  {:<10}{}\n", command->get_name(), description.substr(0, description.find('\n')));
  }
};

CLI::App* add_command(CLI::App& app, const char* name, const char* description) {
  CLI::App* command = app.add_subcommand(name, description);
  command->footer(help::kExitCodes);
  command->set_help_flag("-h,--help", "Print this help and exit");
  return command;
}

void add_info(CLI::App& app, Options& options) {
  CLI::App* command = add_command(app, "info", help::kInfo);
  command->add_option("A.mtx", options.info.matrix, kMatrixHelp)->required()->type_name("");
  command->add_flag("--fill", options.info.fill,
                    "Also order the matrix and count the entries of\n"
                    "its factor, the operations and the memory that\n"
                    "factoring takes (symmetric matrices only)");
  add_common(*command, options.common);
  add_memory(*command, options.common);
  command->callback([&] { options.command = Command::info; });
}

void add_factor(CLI::App& app, Options& options) {
  CLI::App* command = add_command(app, "factor", help::kFactor);
  command->add_option("A.mtx", options.factor.matrix, kMatrixHelp)->required()->type_name("");
  add_common(*command, options.common);
  add_memory(*command, options.common);
  command->callback([&] { options.command = Command::factor; });
}

void add_solve(CLI::App& app, Options& options) {
  CLI::App* command = add_command(app, "solve", help::kSolve);
  command->add_option("A.mtx", options.solve.matrix, kMatrixHelp)->required()->type_name("");
  command
      ->add_option("-b,--rhs", options.solve.right_hand_sides,
                   "Right-hand sides, one in each column, as array\n"
                   "or coordinate. Default: b = A * 1, whose\n"
                   "solution is x = 1 for a regular A")
      ->type_name("B.mtx");
  command
      ->add_option("-o,--output", options.solve.output,
                   "Write x as a Matrix Market array with 17\n"
                   "digits. - is standard output; the report then\n"
                   "goes to standard error")
      ->type_name("X.mtx");
  command
      ->add_option("--method", options.solve.method,
                   "direct: by factorization (the default, and the\n"
                   "only one)")
      ->check(CLI::Validator(check_method, ""))
      ->type_name("NAME");
  add_common(*command, options.common);
  add_memory(*command, options.common);
  command->callback([&] { options.command = Command::solve; });
}

void add_invdiag(CLI::App& app, Options& options) {
  CLI::App* command = add_command(app, "invdiag", help::kInvdiag);
  command->add_option("A.mtx", options.invdiag.matrix, kMatrixHelp)->required()->type_name("");
  command
      ->add_option("-o,--output", options.invdiag.output,
                   "Write the diagonal as a Matrix Market array of\n"
                   "one column with 17 digits. - is standard\n"
                   "output; the report then goes to standard error")
      ->type_name("D.mtx");
  add_common(*command, options.common);
  add_memory(*command, options.common);
  command->callback([&] { options.command = Command::invdiag; });
}

void add_grid(CLI::App& app, Options& options) {
  CLI::App* command = add_command(app, "grid", help::kGrid);
  command->add_option("NX", options.grid.nx, "Points in the first direction")
      ->required()
      ->check(CLI::Validator(check_count, ""))
      ->type_name("");
  command->add_option("NY", options.grid.ny, "Points in the second direction")
      ->required()
      ->check(CLI::Validator(check_count, ""))
      ->type_name("");
  command->add_option("--shift", options.grid.shift, "Added to every diagonal entry. Default: 0")
      ->check(CLI::Validator(check_finite, ""))
      ->type_name("S");
  command->add_option("-o,--output", options.grid.output, "Where to write it. Default: standard output")
      ->type_name("OUT.mtx");
  add_common(*command, options.common);
  command->callback([&] { options.command = Command::grid; });
}

// Where to look for help on what was typed.
std::string help_command(const CLI::App& app) {
  const auto chosen = app.get_subcommands();
  return chosen.empty() ? "qxsm --help" : fmt::format("qxsm {} --help", chosen.front()->get_name());
}

// The library only misses a subcommand; more telling is the word that was given in its place.
[[noreturn]] void refuse(const CLI::App& app, const CLI::ParseError& error, int argc, const char* const* argv) {
  const auto word = std::find_if(argv + 1, argv + argc, [](const char* argument) { return argument[0] != '-'; });
  if (app.get_subcommands().empty() && word != argv + argc) {
    throw CommandError({.what = "found the subcommand " + quote(*word),
                        .expected = "info, factor, solve, invdiag or grid",
                        .advice = "see qxsm --help"});
  }
  throw CommandError({.what = error.what(), .advice = "see " + help_command(app)});
}

std::string help_text(const CLI::App& app) {
  const auto chosen = app.get_subcommands();
  return chosen.empty() ? app.help() : chosen.front()->help("qxsm");
}

}  // namespace

Options parse_options(int argc, const char* const* argv) {
  Options options;
  CLI::App app(help::kMain, "qxsm");
  app.footer(help::kExitCodes);
  app.set_help_flag("-h,--help", "Print this help and exit");
  app.set_version_flag("--version", "qxsm " QXSM_VERSION, "Print the version and exit");
  app.require_subcommand(1);
  app.formatter(std::make_shared<HelpFormatter>());
  add_info(app, options);
  add_factor(app, options);
  add_solve(app, options);
  add_invdiag(app, options);
  add_grid(app, options);
  try {
    app.parse(argc, argv);
  } catch (const CLI::CallForHelp&) {
    options.answer = help_text(app);
  } catch (const CLI::CallForVersion& version) {
    options.answer = std::string(version.what()) + "\n";
  } catch (const CLI::ParseError& error) {
    refuse(app, error, argc, argv);
  }
  options.common.ceiling =
      options.common.memory.empty() ? machine_memory() : parse_memory(options.common.memory).value_or(0);
  return options;
}

bool wants_json(int argc, const char* const* argv) {
  return std::any_of(argv + 1, argv + argc,
                     [](const char* argument) { return std::string_view(argument) == "--json"; });
}

}  // namespace sm::cli
