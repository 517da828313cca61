#include "mixed/summary.hpp"

#include <fmt/core.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <utility>

#include "mixed/summary_tables.hpp"
#include "mixed/text.hpp"
#include "mixed/variance_blocks.hpp"

namespace sm::mixed {
namespace {

std::string count_text(std::int64_t count, const char* one, const char* many) {
  return fmt::format("{} {}", count, count == 1 ? one : many);
}

std::string labelled(const std::string& label, const std::string& text) {
  return wrapped(label + " " + text, kWidth, cells(label) + 1);
}

std::string title(const Fit& fit) {
  if (fit.variances_given) return "Linear mixed model with given variances\n";
  return fit.reml ? "Linear mixed model fit by REML\n" : "Linear mixed model fit by maximum likelihood\n";
}

std::string score_text(const Fit& fit) {
  if (fit.iterations.empty() || !std::isfinite(fit.iterations.back().score)) return "";
  return fmt::format("largest scaled score {:.1e}", fit.iterations.back().score);
}

std::string convergence(const Fit& fit) {
  if (fit.variances_given) return "The variances are given: nothing was estimated but the effects.\n";
  const auto steps = static_cast<std::int64_t>(fit.iterations.empty() ? 0 : fit.iterations.size() - 1);
  std::string facts = fit.optimizer.empty() ? "" : fit.optimizer + ", ";
  facts += count_text(steps, "iteration", "iterations");
  if (const std::string score = score_text(fit); !score.empty()) facts += ", " + score;
  switch (fit.convergence) {
    case Convergence::converged:
      return labelled("Converged:", facts);
    case Convergence::stopped:
      return labelled("STOPPED on request before it converged:",
                      facts + "; what follows is the best point so far, not the optimum");
    case Convergence::not_converged:
      break;
  }
  return labelled("NOT CONVERGED:", facts + "; what follows is the last point, not the optimum");
}

std::string criterion(const Fit& fit) {
  if (!std::isfinite(fit.criterion)) return "";
  const bool at_optimum = fit.convergence == Convergence::converged && !fit.variances_given;
  std::string text = fmt::format("{} {}: {:.4f}\n", fit.reml ? "REML criterion" : "-2 log likelihood",
                                 fit.variances_given ? "at these variances"
                                 : at_optimum        ? "at convergence"
                                                     : "where it stands",
                                 fit.criterion);
  if (fit.variances_given) return text;
  TextTable table{.head = {}, .rows = {{}}, .names = 0};
  table.add_column("AIC", {fmt::format("{:.4f}", fit.aic)});
  table.add_column("BIC", {fmt::format("{:.4f}", fit.bic)});
  table.add_column("logLik", {fmt::format("{:.4f}", fit.loglik)});
  table.add_column("parameters", {fmt::format("{}", fit.n_par)});
  table.add_column("df.resid", {fmt::format("{}", fit.df_residual)});
  return text + table.text();
}

// The quantile that R calls type 7: Hyndman and Fan, "Sample quantiles in statistical packages", The American
// Statistician 50 (1996) 361-365. Moves the values about.
double quantile(std::vector<double>& values, double p) {
  const double place = p * static_cast<double>(values.size() - 1);
  const auto below = values.begin() + static_cast<std::ptrdiff_t>(place);
  std::nth_element(values.begin(), below, values.end());
  if (below + 1 == values.end()) return *below;
  return *below + (place - std::floor(place)) * (*std::min_element(below + 1, values.end()) - *below);
}

std::string residual_quantiles(const Model& model, const Fit& fit) {
  std::vector<double> scaled = standardised_residuals(model, fit);
  if (scaled.empty()) return "";
  TextTable table{.head = {}, .rows = {{}}, .names = 0};
  constexpr std::array<std::pair<const char*, double>, 5> kQuantiles{
      {{"Min", 0.0}, {"1Q", 0.25}, {"Median", 0.5}, {"3Q", 0.75}, {"Max", 1.0}}};
  for (const auto& [name, p] : kQuantiles) table.add_column(name, {fmt::format("{:.4f}", quantile(scaled, p))});
  return "Scaled residuals:\n" + table.text();
}

std::string sizes(const Model& model, const Fit& fit) {
  std::string text = fmt::format("{}", fit.observations);
  for (std::size_t i = 0; i < model.random.size(); ++i) {
    // (x || g) makes several terms of one factor.
    const std::string& group = model.random[i].group;
    const auto same = [&](const RandomTerm& term) {
      return term.group == group && term.known == model.random[i].known &&
             term.levels.size() == model.random[i].levels.size();
    };
    const auto here = model.random.begin() + static_cast<std::ptrdiff_t>(i);
    if (std::find_if(model.random.begin(), here, same) != here) continue;
    text += fmt::format("{} {} {}", i == 0 ? "; levels:" : ",", shown_name(group), model.random[i].levels.size());
    if (!model.random[i].known.empty()) text += fmt::format(" (with {})", shown_name(model.random[i].known));
  }
  std::string out = labelled("Observations:", text);
  if (model.rows_dropped > 0) {
    std::string where;
    for (const auto& [name, count] : model.missing) {
      where += fmt::format("{}{} {}", where.empty() ? " (" : ", ", shown_name(name), count);
    }
    if (!where.empty()) where += ")";
    out += wrapped(count_text(model.rows_dropped, "row was", "rows were") + " left out for missing values" + where,
                   kWidth, 4);
  }
  return out;
}

std::string references(const SummaryOptions& options) {
  std::string text;
  for (const FactorReference& reference : options.references) {
    text += fmt::format("{}{}{} {}", text.empty() ? "" : ", ", shown_name(reference.factor),
                        reference.sum ? " (sum contrasts) without" : "", shown_name(reference.level));
  }
  return text.empty() ? "" : labelled("Reference levels:", text);
}

std::string notes(const Fit& fit) {
  std::vector<std::string> all = fit.messages;
  const bool said = std::any_of(
      all.begin(), all.end(), [](const std::string& message) { return message.find("boundary") != std::string::npos; });
  if (fit.singular && !said) {
    const std::vector<std::string> own = boundary_sentences(fit.varcomp);
    all.insert(all.end(), own.begin(), own.end());
  }
  std::string out;
  for (const std::string& note : all) out += wrapped("- " + printable(note), kWidth, 2);
  return out.empty() ? "" : "Notes:\n" + out;
}

std::string equations(const Fit& fit) {
  const EquationFacts& facts = fit.equations;
  if (facts.order == 0) return "";
  std::string text =
      fmt::format("order {}, {} entries, {} in the factor", facts.order, facts.entries, facts.factor_entries);
  if (fit.variances_given) {
    text += fmt::format(", rank {}, log-determinant {:.6g}; y'Py {:.6g}", fit.rank_equations, fit.log_det_equations,
                        fit.ypy);
  }
  return labelled("Mixed-model equations:", text);
}

}  // namespace

std::string summary(const Model& model, const Fit& fit, const SummaryOptions& options) {
  std::string head = title(fit);
  head += labelled("Formula:", printable(model.formula));
  if (!options.data.empty()) head += labelled("Data:", printable(options.data));
  const std::string sections[] = {head,
                                  criterion(fit) + convergence(fit),
                                  residual_quantiles(model, fit),
                                  variance_table(fit) + sizes(model, fit) + equations(fit),
                                  fixed_table(fit) + references(options) + dependences(fit),
                                  correlation_table(fit, options.most_correlations),
                                  contrast_table(fit),
                                  ratio_table(fit),
                                  notes(fit)};
  std::string out;
  for (const std::string& section : sections) {
    if (!section.empty()) out += (out.empty() ? "" : "\n") + section;
  }
  return out;
}

}  // namespace sm::mixed
