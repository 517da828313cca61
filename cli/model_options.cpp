#include "cli/model_options.hpp"

#include <CLI/CLI.hpp>
#include <algorithm>

#include "cli/validators.hpp"

namespace sm::cli {
namespace {

// An option that may be given several times, each time with one value.
CLI::Option* add_repeated(CLI::App& command, const char* name, std::vector<std::string>& values, const char* type,
                          const char* text) {
  return command.add_option(name, values, text)->type_name(type)->expected(1)->take_all()->allow_extra_args(false);
}

void add_data_options(CLI::App& command, ModelOptions& options) {
  command.add_option("DATA", options.data, "CSV or TSV file with a header, plain or gzip;\n- is standard input")
      ->required()
      ->type_name("");
  command
      .add_option("FORMULA", options.formula,
                  "The model, in quotes: 'y ~ x + f + (x | g)',\n"
                  "with + - * : ^ 0 1, I(x^2), log(x), (x || g),\n"
                  "(1 | a/b)")
      ->required()
      ->type_name("");
  command
      .add_option("--weights", options.weights,
                  "Column of positive weights: the residual variance\n"
                  "of a row is that of the model over its weight")
      ->type_name("COLUMN");
  add_repeated(command, "--factor", options.factors, "COLUMNS",
               "Columns of numbers to be taken as factors: g,f.\n"
               "A text column is one, and so is whatever stands\n"
               "behind a bar");
  add_repeated(command, "--levels", options.levels, "F=A,B,C",
               "The levels of a factor in order, the reference\n"
               "first. Default: as integers when all are, else\n"
               "bytewise")
      ->check(assignment("f=a,b,c"));
  command
      .add_option("--contrasts", options.contrasts,
                  "treatment: each level against the reference (the\n"
                  "default)\n"
                  "sum: the effects of a factor sum to zero")
      ->check(one_of({"treatment", "sum"}))
      ->type_name("NAME");
  command
      .add_option("--na", options.missing,
                  "Rows with a missing value (NA, . or nothing):\n"
                  "drop (the default) or fail")
      ->check(one_of({"drop", "fail"}))
      ->type_name("WHAT");
}

void add_known_precisions(CLI::App& command, ModelOptions& options) {
  command
      .add_option("--pedigree", options.pedigree,
                  "Who descends from whom: a table with the columns\n"
                  "id, sire and dam, for (1 | animal; pedigree)")
      ->type_name("P.csv");
  add_repeated(command, "--kinv", options.kinv, "NAME=K.mtx",
               "The precision matrix of (1 | g; NAME), positive\n"
               "semidefinite; may be given again for other names")
      ->check(assignment("map=q.mtx"));
  add_repeated(command, "--ids", options.ids, "NAME=IDS.txt",
               "The levels that the rows of the matrix stand for,\n"
               "one a line. Default: 1, 2, 3, ...")
      ->check(assignment("map=ids.txt"));
}

void add_question_options(CLI::App& command, ModelOptions& options, bool ratios) {
  add_repeated(command, "--test", options.tests, "'NAME: L'",
               "A linear function of the fixed effects, such as\n"
               "'b - a: 1*f[b] - 1*f[a]' or 'at 3: at(x=3, f=a)';\n"
               "columns may be called by their names. One that is\n"
               "not estimable gets no number. May be given again");
  if (ratios) {
    add_repeated(command, "--ratio", options.ratios, "'R = ...'",
                 "A function of the variances, with a standard error:\n"
                 "'h2 = animal / (animal + residual)'. Default: each\n"
                 "variance over their total. May be given again");
  }
  command.add_option("--predict", options.predict, "Predict the rows of another table, into\npredicted.csv of --out")
      ->type_name("NEW.csv");
  command.add_flag("--pev", options.pev,
                   "Print the random effects, with their conditional\n"
                   "standard deviations and those of prediction");
}

void add_result_options(CLI::App& command, ModelOptions& options) {
  command
      .add_option("--out", options.folder,
                  "Write fixef.csv, ranef.csv, varcomp.csv, vcov.mtx,\n"
                  "fitted.csv and fit.json into this folder")
      ->type_name("DIR");
  command
      .add_option("--plot", options.plots,
                  "Write SVG files into this folder: random effects,\n"
                  "residuals, quantiles, iterations, and patterns of\n"
                  "the equations and their factor")
      ->type_name("DIR");
  command.add_flag("--dry-run", options.dry_run,
                   "Order the equations, tell their size, fill and\n"
                   "memory, and stop");
}

}  // namespace

void add_model_options(CLI::App& command, ModelOptions& options, ModelCommand which) {
  add_data_options(command, options);
  // All three take what the formula may need; the help of lmm leaves it to the others.
  add_known_precisions(command, options);
  if (which == ModelCommand::blup) {
    add_repeated(command, "--var", options.variances, "NAME=V",
                 "The variance of a term by its group, and of the\n"
                 "residual: animal=20, residual=40. Of a term with\n"
                 "several coefficients the lower triangle of their\n"
                 "covariance matrix by columns: subject=600,10,35")
        ->check(assignment("animal=20"));
  } else {
    command.add_flag("--ml", options.ml, "Maximum likelihood; the default is restricted\nmaximum likelihood (REML)");
    command
        .add_option("--start", options.start,
                    "Begin where an earlier fit of this model ended:\n"
                    "the fit.json of its --out")
        ->type_name("FIT.json");
  }
  add_question_options(command, options, which != ModelCommand::blup);
  add_result_options(command, options);
}

void add_pedigree_options(CLI::App& command, PedigreeOptions& pedigree) {
  const auto add = [&](const char* name, std::string& path, const char* type, const char* text) {
    return command.add_option(name, path, text)->type_name(type);
  };
  add("--ainv", pedigree.ainv, "AINV.mtx", "Write the inverse of A as coordinates, rows in\nthe order of the file");
  add("--a", pedigree.a, "A.mtx", "Write A itself as a symmetric array; for small\npedigrees");
  add("--inbreeding", pedigree.inbreeding, "F.csv",
      "Write the inbreeding coefficient of each animal;\nwithout a file, report it")
      ->expected(0, 1);
  add("--mendelian", pedigree.mendelian, "D.csv",
      "Write the Mendelian sampling variance of each\nanimal, as a part of the additive variance; without\n"
      "a file, report it")
      ->expected(0, 1);
  add("--ids", pedigree.ids, "IDS.txt",
      "Write the animals in the order of the rows of A,\none a line. Each result is compressed when its\n"
      "name ends in .gz; - is standard output for one\nof them, and the report then goes to standard\nerror");
}

bool settle_pedigree(const CLI::App& command, PedigreeOptions& pedigree) {
  const auto bare = [&](const char* name, const std::string& path) { return command.count(name) > 0 && path.empty(); };
  pedigree.report_inbreeding = bare("--inbreeding", pedigree.inbreeding);
  pedigree.report_mendelian = bare("--mendelian", pedigree.mendelian);
  const auto paths = {&pedigree.a, &pedigree.ainv, &pedigree.inbreeding, &pedigree.mendelian, &pedigree.ids};
  return std::any_of(paths.begin(), paths.end(), [](const std::string* path) { return *path == "-"; });
}

}  // namespace sm::cli
