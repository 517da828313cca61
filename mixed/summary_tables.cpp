#include "mixed/summary_tables.hpp"

#include <fmt/core.h>

#include <algorithm>
#include <cmath>
#include <limits>
#include <optional>
#include <set>

#include "mixed/distributions.hpp"
#include "mixed/text.hpp"
#include "mixed/variance_blocks.hpp"

namespace sm::mixed {
namespace {

constexpr int kVarianceDigits = 6;
constexpr int kErrorDigits = 5;
constexpr int kRatioDigits = 4;
constexpr double kNaN = std::numeric_limits<double>::quiet_NaN();

std::string df_text(std::optional<double> df) { return decimals_text(df.value_or(kNaN), 2, 1e7); }
std::string t_text(double t) { return decimals_text(t, 3, 1e5); }

std::string p_text(double t, std::optional<double> df) {
  constexpr double kSmallest = 2e-16;
  constexpr double kFixedFrom = 1e-3;
  const double p = student_two_sided(t, df.value_or(kNaN));
  if (std::isnan(p)) return kNoNumber;
  if (p < kSmallest) return "< 2e-16";
  return p < kFixedFrom ? fmt::format("{:.2e}", p) : fmt::format("{:.4f}", p);
}

// An effect's row of numbers; none of them when there is no estimate.
struct Effect {
  std::string name;
  bool known = true;
  double estimate = 0.0;
  double se = 0.0;
  std::optional<double> df;
  double t = 0.0;
};

TextTable effect_table(const std::vector<Effect>& effects) {
  TextTable table{.head = {""}, .rows = {}};
  std::vector<double> estimates;
  std::vector<double> errors;
  std::vector<std::string> dfs;
  std::vector<std::string> ts;
  std::vector<std::string> ps;
  for (const Effect& effect : effects) {
    table.rows.push_back({effect.name});
    estimates.push_back(effect.known ? effect.estimate : kNaN);
    errors.push_back(effect.known ? effect.se : kNaN);
    dfs.push_back(effect.known ? df_text(effect.df) : kNoNumber);
    ts.push_back(effect.known ? t_text(effect.t) : kNoNumber);
    ps.push_back(effect.known ? p_text(effect.t, effect.df) : kNoNumber);
  }
  table.add_column("Estimate", number_column(estimates, kErrorDigits, errors));
  table.add_column("Std. Error", number_column(errors, kErrorDigits));
  table.add_column("df", dfs);
  table.add_column("t value", ts);
  table.add_column("Pr(>|t|)", ps);
  return table;
}

// Headings of the correlations' columns: the names' beginnings where those differ, else numbers.
std::vector<std::string> short_names(const std::vector<std::string>& names, bool& numbered) {
  constexpr std::size_t kShort = 7;
  std::vector<std::string> out;
  out.reserve(names.size());
  for (const std::string& name : names) out.push_back(name == "(Intercept)" ? "(Intr)" : cut(name, kShort));
  numbered = std::set<std::string>(out.begin(), out.end()).size() < out.size();
  for (std::size_t i = 0; numbered && i < out.size(); ++i) out[i] = fmt::format("[{}]", i + 1);
  return out;
}

// Spreads a triangle's rows over further columns of the table: row i has a text for each column before it.
void add_triangle(TextTable& table, const std::vector<std::string>& titles,
                  const std::vector<std::vector<std::string>>& rows) {
  for (std::size_t j = 0; j < titles.size(); ++j) {
    std::vector<std::string> column;
    column.reserve(rows.size());
    for (const auto& row : rows) column.push_back(j < row.size() ? row[j] : "");
    table.add_column(titles[j], column);
  }
}

}  // namespace

std::string shown_name(const std::string& name) { return cut(printable(name), kWidth - 4); }

std::string variance_table(const Fit& fit) {
  if (fit.varcomp.empty()) return "";
  TextTable table{.head = {"Group", "Term"}, .rows = {}, .names = 2, .indent = 1, .widest_name = 24};
  std::vector<double> variances;
  std::vector<double> errors;
  std::vector<double> sds;
  std::vector<std::vector<std::string>> triangle;
  std::size_t widest = 0;
  for (const VarianceBlock& block : variance_blocks(fit.varcomp)) {
    for (std::size_t i = 0; i < block.variances.size(); ++i) {
      const VarianceComponent& component = fit.varcomp[block.variances[i]];
      table.rows.push_back({i == 0 ? shown_name(component.group) : "", shown_name(component.var1)});
      variances.push_back(component.vcov);
      errors.push_back(component.se_observed.value_or(kNaN));
      sds.push_back(component.sdcor);
      triangle.emplace_back();
      for (const std::size_t place : block.correlations[i]) {
        triangle.back().push_back(decimals_text(fit.varcomp[place].sdcor, 3, 2.0));
      }
      widest = std::max(widest, triangle.back().size());
    }
  }
  table.add_column("Variance", number_column(variances, kVarianceDigits));
  if (!fit.variances_given) table.add_column("Std. Error", number_column(errors, kVarianceDigits, variances));
  table.add_column("Std. Dev.", number_column(sds, kVarianceDigits));
  std::vector<std::string> titles(widest);
  if (widest > 0) titles[0] = "Corr.";
  add_triangle(table, titles, triangle);
  return (fit.variances_given ? "Random effects (variances given):\n" : "Random effects:\n") + table.text();
}

std::string fixed_table(const Fit& fit) {
  if (fit.fixef.empty()) return "No fixed effects\n";
  std::vector<Effect> effects;
  for (const FixedEffect& f : fit.fixef) {
    effects.push_back({shown_name(f.name), !f.aliased, f.estimate, f.se, f.df, f.t});
  }
  return "Fixed effects:\n" + effect_table(effects).text();
}

std::string dependences(const Fit& fit) {
  std::string out;
  for (const FixedEffect& f : fit.fixef) {
    if (!f.aliased) continue;
    const std::string text = f.dependence.empty() ? f.name + " depends on the columns before it" : f.dependence;
    out += wrapped("  " + printable(text), kWidth, 6);
  }
  return out.empty() ? "" : "Aliased, without an estimate of their own (—), as columns of the design:\n" + out;
}

std::string correlation_table(const Fit& fit, std::size_t most) {
  std::vector<std::string> names;
  for (const FixedEffect& f : fit.fixef) {
    if (!f.aliased) names.push_back(printable(f.name));
  }
  const std::size_t count = names.size();
  if (count < 2 || count > most || fit.vcov_fixef.size() != count * count) return "";
  bool numbered = false;
  std::vector<std::string> titles = short_names(names, numbered);
  titles.pop_back();
  constexpr std::size_t kWidestName = 24;
  TextTable table{.head = {""}, .rows = {}};
  std::vector<std::vector<std::string>> triangle;
  for (std::size_t i = 0; i < count; ++i) {
    const std::string name = cut(names[i], kWidestName);
    table.rows.push_back({numbered ? fmt::format("{:>4} {}", fmt::format("[{}]", i + 1), name) : name});
    triangle.emplace_back();
    for (std::size_t j = 0; j < i; ++j) {
      const double scale = std::sqrt(fit.vcov_fixef[i * count + i] * fit.vcov_fixef[j * count + j]);
      triangle.back().push_back(decimals_text(fit.vcov_fixef[j * count + i] / scale, 3, 2.0));
    }
  }
  // The first has none before it, and its name heads a column already.
  if (!numbered) {
    table.rows.erase(table.rows.begin());
    triangle.erase(triangle.begin());
  }
  add_triangle(table, titles, triangle);
  return "Correlation of fixed effects:\n" + table.text();
}

std::string contrast_table(const Fit& fit) {
  if (fit.contrasts.empty()) return "";
  std::vector<Effect> effects;
  std::vector<std::string> verdicts;
  std::string reasons;
  for (const Contrast& c : fit.contrasts) {
    effects.push_back({shown_name(c.name), c.estimable, c.estimate, c.se, c.df, c.t});
    verdicts.emplace_back(c.estimable ? "estimable" : "not estimable");
    if (!c.estimable) {
      const std::string reason = c.reason.empty() ? "it lies outside the row space of the design" : c.reason;
      reasons += wrapped("  " + shown_name(c.name) + " is not estimable: " + printable(reason), kWidth, 6);
    }
  }
  TextTable table = effect_table(effects);
  table.add_column("", verdicts);
  return "Contrasts:\n" + table.text() + reasons;
}

std::string ratio_table(const Fit& fit) {
  if (fit.ratios.empty()) return "";
  TextTable table{.head = {""}, .rows = {}};
  std::vector<double> estimates;
  std::vector<double> errors;
  for (const Ratio& ratio : fit.ratios) {
    table.rows.push_back({shown_name(ratio.name)});
    estimates.push_back(ratio.estimate);
    errors.push_back(ratio.se_delta.value_or(kNaN));
  }
  table.add_column("Estimate", number_column(estimates, kRatioDigits));
  table.add_column("Std. Error", number_column(errors, kRatioDigits));
  return "Ratios of variances:\n" + table.text();
}

std::vector<double> standardised_residuals(const Model& model, const Fit& fit) {
  if (!(fit.sigma > 0.0) || !std::isfinite(fit.sigma)) return {};
  std::vector<double> scaled = fit.residuals;
  for (std::size_t i = 0; i < scaled.size(); ++i) {
    scaled[i] *= (model.weights.empty() ? 1.0 : std::sqrt(model.weights.at(i))) / fit.sigma;
  }
  return scaled;
}

}  // namespace sm::mixed
