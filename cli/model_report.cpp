#include "cli/model_report.hpp"

#include <fmt/core.h>

#include <algorithm>

#include "cli/format.hpp"
#include "mixed/text.hpp"

namespace sm::cli {
namespace {

std::string term_text(const mixed::RandomTerm& term) {
  std::string coefs;
  for (const std::string& coef : term.coefs) coefs += (coefs.empty() ? "" : " + ") + mixed::printable(coef);
  return fmt::format("({} | {}), {} levels{}", coefs, mixed::printable(term.group), term.level_count(),
                     term.precision ? ", known precision" : "");
}

// Columns of numbers for some of the levels.
std::string effects_table(const mixed::RandomEffects& effects, std::size_t shown) {
  mixed::TextTable table{.head = {mixed::printable(effects.group)}, .rows = {}, .names = 1, .indent = 1};
  for (std::size_t i = 0; i < shown; ++i) table.rows.push_back({mixed::printable(effects.levels[i])});
  const auto add = [&](const char* title, const std::vector<double>& values) {
    if (values.size() < shown) return;
    table.add_column(title, mixed::number_column({values.data(), shown}, 5));
  };
  add("estimate", effects.estimate);
  add("cond. sd", effects.cond_sd);
  add("pred. sd", effects.pev_sd);
  if (!effects.reliability.empty()) add("reliability", effects.reliability);
  return table.text();
}

}  // namespace

void report_plan(Report& report, const mixed::Model& model, const mixed::EquationFacts& facts, double bytes) {
  report.add("formula", model.formula, "formula", mixed::printable(model.formula));
  report.add("observations", model.rows(), "observations", fmt::format("{}", model.rows()));
  if (model.rows_dropped > 0) {
    report.add("rows_dropped", model.rows_dropped, "left out",
               fmt::format("{} with missing values", model.rows_dropped));
  }
  report.add("fixed_columns", model.fixed.names.size(), "fixed effects",
             fmt::format("{} columns, rank {}", model.fixed.names.size(), model.fixed.rank()));
  report.add_json("rank", model.fixed.rank());
  Json terms = Json::array();
  for (const mixed::RandomTerm& term : model.random) {
    terms.push_back({{"group", term.group}, {"terms", term.coefs}, {"levels", term.level_count()}});
    report.add_text("random effects", term_text(term));
  }
  report.add_json("random", std::move(terms));
  report.add("order", facts.order, "equations", fmt::format("{} unknowns", facts.order));
  report.add("entries", facts.entries, "entries", fmt::format("{} in the upper triangle", facts.entries));
  const double fill =
      static_cast<double>(facts.factor_entries) / static_cast<double>(std::max<std::int64_t>(facts.entries, 1));
  report.add("factor_entries", facts.factor_entries, "factor",
             fmt::format("{} entries, fill ratio {:.4g}", facts.factor_entries, fill));
  report.add("flops", facts.flops, "flops", fmt::format("{:.4g} for each factorization", facts.flops));
  report.add("bytes", bytes, "memory needed", bytes_text(bytes) + " (estimated)");
}

std::string effects_text(const mixed::Fit& fit, std::size_t most) {
  std::string out;
  for (const mixed::RandomEffects& effects : fit.ranef) {
    const std::size_t shown = std::min(most, effects.levels.size());
    out +=
        fmt::format("\nRandom effects of {}, {}:\n", mixed::printable(effects.group), mixed::printable(effects.term));
    out += effects_table(effects, shown);
    if (shown < effects.levels.size()) {
      out += fmt::format(" ... {} more (all are in ranef.csv of --out)\n", effects.levels.size() - shown);
    }
  }
  return out;
}

std::string iteration_line(std::size_t number, const mixed::Iteration& iteration) {
  return fmt::format("{:>3}  criterion {:.6f}  score {:.1e}  step {:.1e}", number, iteration.criterion, iteration.score,
                     iteration.step);
}

}  // namespace sm::cli
