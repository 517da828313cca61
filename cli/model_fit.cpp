#include <fmt/core.h>

#include <algorithm>
#include <chrono>
#include <cmath>
#include <fstream>
#include <limits>
#include <memory>
#include <sstream>

#include "cli/commands.hpp"
#include "cli/facts.hpp"
#include "cli/format.hpp"
#include "cli/interrupt.hpp"
#include "cli/model_input.hpp"
#include "cli/model_report.hpp"
#include "mixed/fit_files.hpp"
#include "mixed/fit_json.hpp"
#include "mixed/plots.hpp"
#include "mixed/summary.hpp"

namespace sm::cli {
namespace {

enum class Kind { lmm, reml, blup };

// What can be found wrong before anything is read.
void check_usage(const ModelOptions& options) {
  if (options.formula.find('~') == std::string::npos && options.data.find('~') != std::string::npos) {
    throw CommandError({.what = fmt::format("found the formula {} where the data are to be named", quote(options.data)),
                        .expected = "the file before the formula",
                        .advice = "change their places: DATA FORMULA"});
  }
  int from_input = 0;
  for (const std::string* path : {&options.data, &options.pedigree, &options.predict})
    from_input += *path == "-" ? 1 : 0;
  if (from_input > 1) {
    throw CommandError({.what = "two tables are to come from standard input", .advice = "give one of them as a file"});
  }
  if (!options.predict.empty() && options.folder.empty()) {
    throw CommandError({.what = "--predict is given",
                        .expected = "--out DIR with it",
                        .advice = "name the folder that predicted.csv is to be written into"});
  }
}

std::string file_text(const std::string& path) {
  std::ifstream file(path, std::ios::binary);
  std::ostringstream text;
  text << file.rdbuf();
  if (!file || !text) {
    throw CommandError({.file = path, .what = "cannot be read", .advice = "check the name and its permissions"});
  }
  return text.str();
}

class ModelFit {
 public:
  ModelFit(Kind kind, const ModelOptions& options, const CommonOptions& common, Progress& progress)
      : kind_(kind), options_(options), common_(common), progress_(progress) {}

  Report run();

 private:
  void read();
  void fit();
  double bytes_for(const mixed::EquationFacts& facts) const { return static_cast<double>(resident_) + facts.bytes; }
  void refuse_large(const mixed::EquationFacts& facts) const;
  mixed::FitOptions fit_options();
  bool note(const mixed::Iteration& iteration);
  void begin(const std::string& doing, double flops);
  void predict();
  void write();
  Report plan_report(const mixed::EquationFacts& facts) const;
  Report report() const;
  std::string text() const;

  const char* command() const { return kind_ == Kind::lmm ? "lmm" : kind_ == Kind::reml ? "reml" : "blup"; }

  Kind kind_;
  const ModelOptions& options_;
  const CommonOptions& common_;
  Progress& progress_;
  std::chrono::steady_clock::time_point begin_ = std::chrono::steady_clock::now();
  std::unique_ptr<ModuleSession> session_;
  mixed::Module module_;
  mixed::Formula formula_;
  mixed::Model model_;
  mixed::Fit fit_;
  std::vector<std::string> notes_;
  std::uint64_t resident_ = 0;  // when the model stood
  std::size_t iterations_ = 0;
  double flops_ = 0.0;  // of the step under way
  double rate_ = 2e9;   // operations a second, as met last
  std::chrono::steady_clock::time_point step_begin_;
};

void ModelFit::read() {
  formula_ = mixed::parse_formula(options_.formula);
  KnownPrecisions precisions(options_, formula_);
  progress_.phase("reading " + options_.data);
  const mixed::Table table = mixed::Table::read(options_.data);
  session_ = std::make_unique<ModuleSession>(pool_ceiling(common_));
  module_ = mixed_module(*session_);
  module_.begin = [this](const std::string& doing, double flops) { begin(doing, flops); };
  mixed::DesignOptions design = design_options(options_);
  design.variances_given = kind_ == Kind::blup;
  design.known = [&](const std::string& name) { return precisions.get(name, module_, common_.ceiling, progress_); };
  progress_.phase("making the model");
  model_ = mixed::build_model(table, formula_, design);
  notes_ = model_.notes;
  notes_.insert(notes_.end(), precisions.notes().begin(), precisions.notes().end());
  session_->trim();
  resident_ = resident();
}

// One line for each iteration; false when Ctrl-C was pressed.
bool ModelFit::note(const mixed::Iteration& iteration) {
  progress_.keep(iteration_line(iterations_++, iteration));
  return !InterruptWatch::interrupted();
}

// The last long step tells how fast this machine is today.
void ModelFit::begin(const std::string& doing, double flops) {
  const auto now = std::chrono::steady_clock::now();
  const double seconds = std::chrono::duration<double>(now - step_begin_).count();
  if (flops_ > 0.0 && seconds > 0.01) rate_ = flops_ / seconds;
  flops_ = flops;
  step_begin_ = now;
  progress_.phase(flops > 1e8 ? fmt::format("{} ({:.3g} Gflop)", doing, flops / 1e9) : doing);
  progress_.expect(flops / rate_);
}

mixed::FitOptions ModelFit::fit_options() {
  mixed::FitOptions options;
  options.reml = !options_.ml;
  if (kind_ == Kind::blup) options.variances = given_variances(options_.variances, model_, formula_);
  if (!options_.start.empty()) {
    options.start = mixed::start_theta(file_text(options_.start), model_, options_.start);
  }
  options.contrasts = contrast_requests(options_.tests, model_);
  options.ratios = ratio_requests(options_.ratios, model_, kind_ == Kind::reml);
  options.spy = !options_.plots.empty();
  options.progress = [this](const mixed::Iteration& iteration) { return note(iteration); };
  return options;
}

void ModelFit::refuse_large(const mixed::EquationFacts& facts) const {
  const double bytes = bytes_for(facts);
  if (bytes <= static_cast<double>(common_.ceiling)) return;
  throw CommandError({.code = ExitCode::no_memory,
                      .what = fmt::format("the fit would take about {}: more than the {} of --memory",
                                          bytes_text(bytes), bytes_text(static_cast<double>(common_.ceiling))),
                      .advice = "raise --memory, or make the model smaller; --dry-run tells its size"});
}

void ModelFit::fit() {
  const mixed::FitOptions options = fit_options();
  if (!common_.memory.empty()) {
    progress_.phase("ordering the equations");
    refuse_large(mixed::plan(model_, module_, options.reml));
  }
  const InterruptWatch watch;
  fit_ = mixed::fit(model_, module_, options);
}

// Rows that cannot be predicted, for missing values, are left without a number.
void ModelFit::predict() {
  if (options_.predict.empty()) return;
  progress_.phase("predicting");
  const mixed::Table table = mixed::Table::read(options_.predict);
  const mixed::NewRows rows = mixed::new_rows(*model_.recipe, table);
  std::vector<mixed::PredictionTerm> terms;
  for (std::size_t t = 0; t < rows.random.size(); ++t) {
    const mixed::NewRows::Term& term = rows.random[t];
    terms.push_back({.level = term.level, .z = term.z});
    if (term.unseen == 0) continue;
    notes_.push_back(
        fmt::format("{}: {} of {} rows have a level of {} that the data do not have, and are predicted with "
                    "a random effect of 0",
                    table.name(), term.unseen, table.rows(), model_.random[t].group));
  }
  const std::vector<double> predicted = mixed::predict(fit_, rows.x, terms);
  fit_.predicted.assign(static_cast<std::size_t>(table.rows()), std::numeric_limits<double>::quiet_NaN());
  for (std::size_t i = 0; i < rows.row.size(); ++i) {
    fit_.predicted[static_cast<std::size_t>(rows.row[i])] = predicted[i];
  }
}

void ModelFit::write() {
  progress_.phase("writing");
  if (!options_.folder.empty()) mixed::write_fit(options_.folder, model_, fit_);
  if (!options_.plots.empty()) mixed::write_plots(options_.plots, model_, fit_);
}

std::string ModelFit::text() const {
  mixed::SummaryOptions summary;
  summary.data = options_.data == "-" ? "standard input" : options_.data;
  const std::vector<std::string>& columns = model_.fixed.names;
  for (const mixed::ModelFactor& factor : model_.factors) {
    if (factor.levels.empty()) continue;
    // Without an intercept the first level has a column like the others.
    const std::string first = factor.name + factor.levels.front();
    if (std::find(columns.begin(), columns.end(), first) != columns.end()) continue;
    summary.references.push_back({.factor = factor.name,
                                  .level = model_.sum_contrasts ? factor.levels.back() : factor.levels.front(),
                                  .sum = model_.sum_contrasts});
  }
  std::string out = mixed::summary(model_, fit_, summary);
  if (options_.pev) out += effects_text(fit_);
  if (!options_.folder.empty()) out += fmt::format("\nWritten into {}: the tables and fit.json\n", options_.folder);
  if (!options_.plots.empty()) out += fmt::format("\nWritten into {}: the plots\n", options_.plots);
  return out;
}

Report ModelFit::plan_report(const mixed::EquationFacts& facts) const {
  Report report(command());
  report.add_json("dry_run", true);
  report_plan(report, model_, facts, bytes_for(facts));
  for (const std::string& note : notes_) report.add_text("note", note);
  report.add_json("notes", notes_);
  return report;
}

Report ModelFit::report() const {
  Report report(command());
  report.replace(common_.json ? "" : text(), common_.json ? mixed::fit_json(model_, fit_) : "");
  if (fit_.convergence == mixed::Convergence::converged || fit_.variances_given) return report;
  const bool stopped = fit_.convergence == mixed::Convergence::stopped;
  if (!stopped && !fit_.obstacle.empty()) {
    report.fail({.code = ExitCode::no,
                 .what = "the fit did not converge: " + fit_.obstacle,
                 .advice = "simplify the model, or look for rounding in the response"});
    return report;
  }
  report.fail({.code = ExitCode::no,
               .what = stopped ? "stopped before the fit converged" : "the fit did not converge",
               .advice = options_.folder.empty()
                             ? "give --out DIR, so that a later run can go on from its fit.json (--start)"
                             : fmt::format("go on with --start {}/fit.json", options_.folder)});
  return report;
}

Report ModelFit::run() {
  check_usage(options_);
  for (const std::string* folder : {&options_.folder, &options_.plots}) {
    if (!folder->empty() && !options_.dry_run) mixed::prepare_folder(*folder);
  }
  read();
  if (options_.dry_run) {
    progress_.phase("ordering the equations");
    return plan_report(mixed::plan(model_, module_, !options_.ml));
  }
  fit();
  predict();
  fit_.messages.insert(fit_.messages.end(), notes_.begin(), notes_.end());
  const std::chrono::duration<double> seconds = std::chrono::steady_clock::now() - begin_;
  fit_.seconds = seconds.count();
  fit_.peak_bytes = static_cast<double>(peak_resident());
  write();
  return report();
}

}  // namespace

Report run_lmm(const ModelOptions& options, const CommonOptions& common, Progress& progress) {
  return ModelFit(Kind::lmm, options, common, progress).run();
}

Report run_reml(const ModelOptions& options, const CommonOptions& common, Progress& progress) {
  return ModelFit(Kind::reml, options, common, progress).run();
}

Report run_blup(const ModelOptions& options, const CommonOptions& common, Progress& progress) {
  return ModelFit(Kind::blup, options, common, progress).run();
}

}  // namespace sm::cli
