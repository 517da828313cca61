#include "mixed/fit_files.hpp"

#include <fmt/core.h>

#include <algorithm>
#include <cmath>
#include <initializer_list>
#include <iterator>
#include <limits>
#include <optional>
#include <span>

#include "mixed/distributions.hpp"
#include "mixed/fit_json.hpp"
#include "mixed/text.hpp"

namespace sm::mixed {
namespace {

constexpr double kNaN = std::numeric_limits<double>::quiet_NaN();

constexpr std::size_t kLongestComment = 200;  // the format bounds its lines

constexpr const char* kCovariances = "vcov.mtx";
constexpr const char* kPredictions = "predicted.csv";

std::string field(double value) { return std::isfinite(value) ? fmt::format("{}", value) : std::string(); }
std::string field(std::optional<double> value) { return field(value.value_or(kNaN)); }

// Of a column that may not have been computed.
std::string field(const std::vector<double>& values, std::size_t i) {
  return i < values.size() ? field(values[i]) : "";
}

void add_line(std::string& out, std::initializer_list<std::string> fields) {
  const char* separator = "";
  for (const std::string& text : fields) {
    out.append(separator).append(text);
    separator = ",";
  }
  out += '\n';
}

std::string fixed_effects(const Fit& fit) {
  std::string out = "name,estimate,se,df,t,p,aliased,dependence\n";
  for (const FixedEffect& f : fit.fixef) {
    if (f.aliased) {
      add_line(out, {csv_field(f.name), "", "", "", "", "", "true", csv_field(f.dependence)});
    } else {
      const double p = student_two_sided(f.t, f.df.value_or(kNaN));
      add_line(out,
               {csv_field(f.name), field(f.estimate), field(f.se), field(f.df), field(f.t), field(p), "false", ""});
    }
  }
  return out;
}

std::string random_effects(const Fit& fit) {
  const auto has_reliability = [](const RandomEffects& r) { return !r.reliability.empty(); };
  const bool reliability = std::any_of(fit.ranef.begin(), fit.ranef.end(), has_reliability);
  std::string out = "group,term,level,estimate,cond_sd,pev_sd";
  out += reliability ? ",reliability\n" : "\n";
  for (const RandomEffects& r : fit.ranef) {
    const std::string names = csv_field(r.group) + "," + csv_field(r.term) + ",";
    for (std::size_t i = 0; i < r.levels.size(); ++i) {
      out.append(names).append(csv_field(r.levels[i]));
      for (const auto* values : {&r.estimate, &r.cond_sd, &r.pev_sd}) out.append(",").append(field(*values, i));
      if (reliability) out.append(",").append(field(r.reliability, i));
      out += '\n';
    }
  }
  return out;
}

std::string variances(const Fit& fit) {
  std::string out = "group,var1,var2,vcov,sdcor,se_observed,se_average\n";
  for (const VarianceComponent& c : fit.varcomp) {
    add_line(out, {csv_field(c.group), csv_field(c.var1), csv_field(c.var2), field(c.vcov), field(c.sdcor),
                   field(c.se_observed), field(c.se_average)});
  }
  return out;
}

// Rows are counted from 1 after the header of the table, with those that were left out.
std::string fitted_values(const Model& model, const Fit& fit) {
  std::string out = "row,response,fitted,residual\n";
  for (std::size_t i = 0; i < fit.fitted.size(); ++i) {
    const std::int64_t row = i < model.row.size() ? model.row[i] : static_cast<std::int64_t>(i);
    fmt::format_to(std::back_inserter(out), "{},{},{},{}\n", row + 1, field(model.y, i), field(fit.fitted, i),
                   field(fit.residuals, i));
  }
  return out;
}

std::string predictions(const Fit& fit) {
  std::string out = "row,predicted\n";
  for (std::size_t i = 0; i < fit.predicted.size(); ++i) {
    fmt::format_to(std::back_inserter(out), "{},{}\n", i + 1, field(fit.predicted[i]));
  }
  return out;
}

// The lower triangle by columns, as the format has symmetric arrays.
std::string covariances(const std::vector<std::string>& names, const std::vector<double>& values) {
  std::string out = "%%MatrixMarket matrix array real symmetric\n% covariances of the fixed effects\n";
  for (const std::string& name : names) out += "% " + cut(printable(name), kLongestComment) + "\n";
  fmt::format_to(std::back_inserter(out), "{} {}\n", names.size(), names.size());
  for (std::size_t column = 0; column < names.size(); ++column) {
    for (std::size_t row = column; row < names.size(); ++row) {
      fmt::format_to(std::back_inserter(out), "{}\n", values[column * names.size() + row]);
    }
  }
  return out;
}

}  // namespace

std::string csv_field(const std::string& text) {
  const bool blank_edge = !text.empty() && (text.front() == ' ' || text.back() == ' ');
  if (!blank_edge && text.find_first_of(",\"\r\n\t;") == std::string::npos) return text;
  std::string out = "\"";
  for (const char c : text) {
    if (c == '"') out += '"';
    out += c;
  }
  return out + "\"";
}

std::vector<NamedText> fit_files(const Model& model, const Fit& fit) {
  std::vector<NamedText> files{{"fixef.csv", fixed_effects(fit)},
                               {"ranef.csv", random_effects(fit)},
                               {"varcomp.csv", variances(fit)},
                               {"fitted.csv", fitted_values(model, fit)},
                               {"fit.json", fit_json(model, fit)}};
  std::vector<std::string> kept;
  for (const FixedEffect& f : fit.fixef) {
    if (!f.aliased) kept.push_back(f.name);
  }
  const std::vector<double>& vcov = fit.vcov_fixef;
  const bool known = !kept.empty() && vcov.size() == kept.size() * kept.size() &&
                     std::all_of(vcov.begin(), vcov.end(), [](double value) { return std::isfinite(value); });
  if (known) files.push_back({kCovariances, covariances(kept, vcov)});
  if (!fit.predicted.empty()) files.push_back({kPredictions, predictions(fit)});
  return files;
}

void write_fit(const std::string& folder, const Model& model, const Fit& fit) {
  const std::vector<NamedText> files = fit_files(model, fit);
  std::vector<std::string> outdated;
  for (const char* name : {kCovariances, kPredictions}) {
    const auto is_it = [name](const NamedText& file) { return file.name == name; };
    if (std::none_of(files.begin(), files.end(), is_it)) outdated.emplace_back(name);
  }
  write_files(folder, files, outdated);
}

}  // namespace sm::mixed
