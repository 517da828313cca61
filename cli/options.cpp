#include "cli/options.hpp"

#include <fmt/format.h>

#include <CLI/CLI.hpp>
#include <algorithm>
#include <limits>
#include <memory>
#include <string_view>
#include <vector>

#include "cli/error.hpp"
#include "cli/fields.hpp"
#include "cli/format.hpp"
#include "cli/help.hpp"
#include "cli/model_options.hpp"
#include "cli/orderings.hpp"
#include "cli/validators.hpp"
#include "mixed/words.hpp"

namespace sm::cli {
namespace {

constexpr const char* kMatrixHelp = "Matrix Market file, plain or gzip;\n- is standard input";

// In the list of subcommands, the first line of a description stands for it.
class HelpFormatter : public CLI::Formatter {
 public:
  std::string make_subcommand(const CLI::App* command) const override {
    const std::string description = command->get_description();
    return fmt::format("  {:<11}{}\n", command->get_name(), description.substr(0, description.find('\n')));
  }
};

// A subcommand, which calls run(its options, ...), without options as yet.
template <auto run, auto its_options>
CLI::App* add_command(CLI::App& app, Options& options, const char* name, const char* description) {
  CLI::App* command = app.add_subcommand(name, description);
  command->footer(help::kExitCodes);
  command->set_help_flag("-h,--help", "Print this help and exit");
  command->callback([&options] {
    options.run = [](const Options& given, Progress& progress) {
      return run(given.*its_options, given.common, progress);
    };
  });
  return command;
}

void add_file(CLI::App& command, std::string& path, const char* name = "A.mtx", const char* text = kMatrixHelp) {
  command.add_option(name, path, text)->required()->type_name("");
}

void add_output(CLI::App& command, Options& options, const char* name, const std::string& what) {
  command
      .add_option("-o,--output", options.common.output,
                  what +
                      "\nwith 17 digits; gzip when the name ends in .gz.\n"
                      "- is standard output; the report then goes to\n"
                      "standard error")
      ->type_name(name);
}

void add_reports(CLI::App& command, Options& options) {
  command.add_flag("--json", options.common.json,
                   "Print one JSON object on standard output,\n"
                   "with the same facts; for errors too");
  command.add_flag("--quiet", options.common.quiet,
                   "Print nothing but errors, no progress either;\n"
                   "with --json, the object only");
}

// Of those that factor; `when` says when they do, if not always.
void add_ordering(CLI::App& command, Options& options, const std::string& when = "") {
  command
      .add_option("--ordering", options.common.ordering,
                  when +
                      "The order of elimination.\n"
                      "md: minimum degree (the default)\n"
                      "amd: approximate minimum degree, by AMD\n"
                      "metis: nested dissection, by METIS; takes longer\n"
                      "to find, and pays on 3-D grids and wide stencils\n"
                      "natural: as in the file")
      ->check(one_of(ordering_names()))
      ->type_name("NAME");
}

// What every subcommand with a matrix ends with.
void add_common(CLI::App& command, Options& options) {
  add_reports(command, options);
  command
      .add_option("--memory", options.common.memory,
                  "Ceiling for the memory pools of the computation,\n"
                  "and for what is kept of a file: 512M, 4G (K, M,\n"
                  "G, T are powers of 1024). Past it the run ends\n"
                  "with exit code 3. Default: what this machine has")
      ->check(memory_size())
      ->type_name("SIZE");
}

void add_info(CLI::App& app, Options& options) {
  CLI::App* command = add_command<run_info, &Options::info>(app, options, "info", help::kInfo);
  add_file(*command, options.info.matrix);
  command->add_flag("--fill", options.info.fill,
                    "Also order the matrix and count the entries of\n"
                    "its factor, the operations and the memory that\n"
                    "factoring takes (symmetric matrices only)");
  add_ordering(*command, options, "With --fill. ");
  add_common(*command, options);
}

void add_factor(CLI::App& app, Options& options) {
  CLI::App* command = add_command<run_factor, &Options::factor>(app, options, "factor", help::kFactor);
  add_file(*command, options.factor.matrix);
  add_ordering(*command, options);
  add_common(*command, options);
}

void add_solve(CLI::App& app, Options& options) {
  CLI::App* command = add_command<run_solve, &Options::solve>(app, options, "solve", help::kSolve);
  add_file(*command, options.solve.matrix);
  command
      ->add_option("-b,--rhs", options.solve.right_hand_sides,
                   "Right-hand sides, one in each column, as array\n"
                   "or coordinate. Default: b = A * 1, whose\n"
                   "solution is x = 1 for a regular A")
      ->type_name("B.mtx");
  add_output(*command, options, "X.mtx", "Write x as a Matrix Market array");
  command
      ->add_option("--method", options.solve.method,
                   "direct: by factorization (the default)\n"
                   "cg: by conjugate gradients with a diagonal\n"
                   "preconditioner, without factoring")
      ->check(one_of({"direct", "cg"}))
      ->type_name("NAME");
  command
      ->add_option("--tolerance", options.solve.tolerance,
                   "cg: a right-hand side is solved when its\n"
                   "preconditioned residual is at most T times what\n"
                   "it was at the start. Default: 1e-10")
      ->check(tolerance())
      ->type_name("T");
  command
      ->add_option("--max-iterations", options.solve.max_iterations,
                   "cg: steps for each right-hand side; when they\n"
                   "are not enough, the exit code is 1. Default: the\n"
                   "order of A, plus 2")
      ->check(count())
      ->type_name("K");
  add_ordering(*command, options, "direct: ");
  add_common(*command, options);
}

void add_invdiag(CLI::App& app, Options& options) {
  CLI::App* command = add_command<run_invdiag, &Options::invdiag>(app, options, "invdiag", help::kInvdiag);
  add_file(*command, options.invdiag.matrix);
  add_output(*command, options, "D.mtx", "Write the diagonal as a Matrix Market array of\none column");
  add_ordering(*command, options);
  add_common(*command, options);
}

void add_quad(CLI::App& app, Options& options) {
  CLI::App* command = add_command<run_quad, &Options::quad>(app, options, "quad", help::kQuad);
  add_file(*command, options.quad.matrix);
  add_file(*command, options.quad.rows, "X.mtx", "The rows of the form; as many columns as A");
  command->add_flag("--inverse", options.quad.inverse, "X A^- X' instead of X A X'; A is factored");
  add_output(*command, options, "F.mtx",
             "Write the form as a symmetric Matrix Market\n"
             "file: an array with --inverse or for a general\n"
             "array X, else coordinates;");
  add_ordering(*command, options, "With --inverse. ");
  add_common(*command, options);
}

void add_trace(CLI::App& app, Options& options) {
  CLI::App* command = add_command<run_trace, &Options::trace>(app, options, "trace", help::kTrace);
  add_file(*command, options.trace.matrix);
  command->add_option("B.mtx", options.trace.other, "The second matrix of a product, if any")->type_name("");
  command->add_flag("--inverse", options.trace.inverse,
                    "tr(A^-) or tr(A^- B), with A symmetric; A is\n"
                    "factored");
  add_ordering(*command, options, "With --inverse. ");
  add_common(*command, options);
}

void add_hermite(CLI::App& app, Options& options) {
  CLI::App* command = add_command<run_hermite, &Options::hermite>(app, options, "hermite", help::kHermite);
  add_file(*command, options.hermite.matrix);
  add_output(*command, options, "H.mtx", "Write H as Matrix Market coordinates");
  add_ordering(*command, options);
  add_common(*command, options);
}

void add_estimable(CLI::App& app, Options& options) {
  CLI::App* command = add_command<run_estimable, &Options::estimable>(app, options, "estimable", help::kEstimable);
  add_file(*command, options.estimable.matrix);
  add_file(*command, options.estimable.rows, "L.mtx", "The rows to be tested; as many columns as A");
  command
      ->add_option("--tolerance", options.estimable.tolerance,
                   "What an element of l H or A A^- l may differ\n"
                   "from that of l, as a part of the largest element\n"
                   "of l. Default: 1e-6")
      ->check(tolerance())
      ->type_name("T");
  add_ordering(*command, options);
  add_common(*command, options);
}

void add_convert(CLI::App& app, Options& options) {
  CLI::App* command = add_command<run_convert, &Options::convert>(app, options, "convert", help::kConvert);
  add_file(*command, options.convert.matrix, "IN.mtx");
  add_file(*command, options.common.output, "OUT.mtx",
           "Where to write it, with 17 digits; gzip when the\n"
           "name ends in .gz. - is standard output, without\n"
           "a report");
  command
      ->add_option("--to", options.convert.to,
                   "sparse: coordinates\n"
                   "dense: an array of the whole matrix\n"
                   "packed: an array of the lower triangle, by\n"
                   "columns; the matrix must be symmetric")
      ->required()
      ->check(one_of({"sparse", "dense", "packed"}))
      ->type_name("FORM");
  add_common(*command, options);
}

void add_pedigree(CLI::App& app, Options& options) {
  CLI::App* command = add_command<run_pedigree, &Options::pedigree>(app, options, "pedigree", help::kPedigree);
  add_file(*command, options.pedigree.pedigree, "PEDIGREE.csv", "CSV or TSV file, plain or gzip;\n- is standard input");
  add_pedigree_options(*command, options.pedigree);
  add_common(*command, options);
}

void add_grid(CLI::App& app, Options& options) {
  CLI::App* command = add_command<run_grid, &Options::grid>(app, options, "grid", help::kGrid);
  command->add_option("NX", options.grid.nx, "Points in the first direction")
      ->required()
      ->check(count())
      ->type_name("");
  command->add_option("NY", options.grid.ny, "Points in the second direction")
      ->required()
      ->check(count())
      ->type_name("");
  command->add_option("--shift", options.grid.shift, "Added to every diagonal entry. Default: 0")
      ->check(finite_number("a finite number", std::numeric_limits<double>::lowest()))
      ->type_name("S");
  command
      ->add_option("-o,--output", options.common.output,
                   "Where to write it; gzip when the name ends in\n"
                   ".gz. Default: standard output, without a report")
      ->type_name("OUT.mtx");
  add_reports(*command, options);
}

template <auto run>
void add_model(CLI::App& app, Options& options, const char* name, const char* help, ModelCommand which) {
  CLI::App* command = add_command<run, &Options::model>(app, options, name, help);
  add_model_options(*command, options.model, which);
  add_common(*command, options);
}

void add_subcommands(CLI::App& app, Options& options) {
  add_info(app, options);
  add_factor(app, options);
  add_solve(app, options);
  add_invdiag(app, options);
  add_quad(app, options);
  add_trace(app, options);
  add_hermite(app, options);
  add_estimable(app, options);
  add_convert(app, options);
  add_pedigree(app, options);
  add_model<run_lmm>(app, options, "lmm", help::kLmm, ModelCommand::lmm);
  add_model<run_reml>(app, options, "reml", help::kReml, ModelCommand::reml);
  add_model<run_blup>(app, options, "blup", help::kBlup, ModelCommand::blup);
  add_grid(app, options);
}

// Where to look for help on what was typed.
std::string help_command(const CLI::App& app) {
  const auto chosen = app.get_subcommands();
  return chosen.empty() ? "qxsm --help" : fmt::format("qxsm {} --help", chosen.front()->get_name());
}

// What the subcommand has no place for: an option with another name, or words more than it takes.
void refuse_extra(const CLI::App& app) {
  if (app.get_subcommands().empty()) return;
  const CLI::App& command = *app.get_subcommands().front();
  std::vector<std::string> extras = command.remaining(true);
  if (extras.empty()) extras = app.remaining();  // in front of the subcommand
  const auto option =
      std::find_if(extras.begin(), extras.end(), [](const std::string& word) { return word.starts_with('-'); });
  if (option == extras.end()) {
    const std::string words = fmt::format("{}", fmt::join(extras, " "));
    throw CommandError({.what = fmt::format("found {} behind the last argument that is asked for", quote(words)),
                        .expected = "a file name or a formula with blanks in it to stand in quotes",
                        .advice = "see " + help_command(app)});
  }
  const std::string name = option->substr(0, option->find('='));
  std::vector<std::string> known;
  for (const CLI::Option* each : command.get_options()) {
    for (const std::string& long_name : each->get_lnames()) known.push_back("--" + long_name);
  }
  const std::string near = mixed::nearest_name(name, known);
  throw CommandError({.what = fmt::format("found {}, which is no option of qxsm {}{}", name, command.get_name(),
                                          near.empty() ? "" : fmt::format(" (did you mean {}?)", near)),
                      .advice = "see " + help_command(app)});
}

// The library only misses a subcommand; more telling is the word that was given in its place.
[[noreturn]] void refuse(const CLI::App& app, const CLI::ParseError& error, int argc, const char* const* argv) {
  const auto word = std::find_if(argv + 1, argv + argc, [](const char* argument) { return argument[0] != '-'; });
  if (app.get_subcommands().empty() && word != argv + argc) {
    std::vector<std::string> names;
    for (const CLI::App* command : app.get_subcommands({})) names.push_back(command->get_name());
    throw CommandError(
        {.what = "found the subcommand " + quote(*word), .expected = alternatives(names), .advice = "see qxsm --help"});
  }
  if (dynamic_cast<const CLI::ExtrasError*>(&error)) refuse_extra(app);
  throw CommandError({.what = error.what(), .advice = "see " + help_command(app)});
}

std::string help_text(const CLI::App& app) {
  const auto chosen = app.get_subcommands();
  return chosen.empty() ? app.help() : chosen.front()->help("qxsm");
}

// An order is for those that factor.
void require_use_of_ordering(const CLI::App& app, const Options& options) {
  if (options.common.ordering.empty()) return;
  const char* const wanted = app.got_subcommand("info") && !options.info.fill              ? "--fill"
                             : app.got_subcommand("quad") && !options.quad.inverse         ? "--inverse"
                             : app.got_subcommand("trace") && !options.trace.inverse       ? "--inverse"
                             : app.got_subcommand("solve") && options.solve.method == "cg" ? "--method direct"
                                                                                           : nullptr;
  if (!wanted) return;
  throw CommandError({.what = "--ordering is given",
                      .expected = fmt::format("{} with it", wanted),
                      .advice = "see " + help_command(app)});
}

// What the options say together.
void settle(const CLI::App& app, Options& options) {
  const SolveOptions& solve = options.solve;
  if (solve.method == "direct" && (solve.tolerance || solve.max_iterations)) {
    throw CommandError({.what = std::string(solve.tolerance ? "--tolerance" : "--max-iterations") + " is given",
                        .expected = "--method cg with it",
                        .advice = "see " + help_command(app)});
  }
  require_use_of_ordering(app, options);
  options.filter = app.got_subcommand("convert") || app.got_subcommand("grid");
  if (app.got_subcommand("grid") && options.common.output.empty()) options.common.output = "-";
  if (app.got_subcommand("pedigree") && settle_pedigree(*app.get_subcommand("pedigree"), options.pedigree)) {
    options.common.output = "-";
  }
  options.common.ceiling =
      options.common.memory.empty() ? machine_memory() : parse_memory(options.common.memory).value_or(0);
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
  add_subcommands(app, options);
  try {
    app.parse(argc, argv);
  } catch (const CLI::CallForHelp&) {
    options.answer = help_text(app);
  } catch (const CLI::CallForVersion& version) {
    options.answer = std::string(version.what()) + "\n";
  } catch (const CLI::ParseError& error) {
    refuse(app, error, argc, argv);
  }
  if (options.answer.empty()) settle(app, options);
  return options;
}

bool wants_json(int argc, const char* const* argv) {
  return std::any_of(argv + 1, argv + argc,
                     [](const char* argument) { return std::string_view(argument) == "--json"; });
}

}  // namespace sm::cli
