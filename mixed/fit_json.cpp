#include "mixed/fit_json.hpp"

#include <algorithm>
#include <cmath>
#include <nlohmann/json.hpp>
#include <numeric>

#include "mixed/error.hpp"

namespace sm::mixed {
namespace {

using Json = nlohmann::ordered_json;

Json number(double value) { return std::isfinite(value) ? Json(value) : Json(); }
Json number(const std::optional<double>& value) { return value ? number(*value) : Json(); }
Json name(const std::string& text) { return text.empty() ? Json() : Json(text); }

Json numbers(const std::vector<double>& values) {
  Json out = Json::array();
  for (const double value : values) out.push_back(number(value));
  return out;
}

Json matrix(const std::vector<double>& by_columns, std::size_t order) {
  Json out = Json::array();
  for (std::size_t i = 0; i < order; ++i) {
    Json row = Json::array();
    for (std::size_t j = 0; j < order; ++j) row.push_back(number(by_columns.at(j * order + i)));
    out.push_back(std::move(row));
  }
  return out;
}

Json random_terms(const Model& model) {
  Json out = Json::array();
  for (const RandomTerm& term : model.random) {
    out.push_back({{"group", term.group},
                   {"terms", term.coefs},
                   {"levels", term.level_count()},
                   {"covariance", term.coef_count() == 1 ? "scalar" : "unstructured"}});
  }
  return out;
}

Json variances(const Fit& fit) {
  Json out = Json::array();
  for (const VarianceComponent& c : fit.varcomp) {
    out.push_back({{"group", c.group},
                   {"var1", name(c.var1)},
                   {"var2", name(c.var2)},
                   {"vcov", number(c.vcov)},
                   {"sdcor", number(c.sdcor)},
                   {"se_observed", number(c.se_observed)},
                   {"se_average", number(c.se_average)}});
  }
  return out;
}

Json information(const Fit& fit) {
  Json out{{"order", "as varcomp (free components only)"}, {"free", Json::array()}};
  for (const std::size_t place : fit.free) out["free"].push_back(place + 1);
  const std::size_t order = fit.free.size();
  const auto whole = [&](const std::vector<double>& values) { return values.size() == order * order; };
  out["observed"] = whole(fit.information_observed) ? matrix(fit.information_observed, order) : Json();
  out["average"] = whole(fit.information_average) ? matrix(fit.information_average, order) : Json();
  return out;
}

void add_fixed(Json& out, const Fit& fit) {
  Json all = Json::array();
  Json kept = Json::array();
  Json aliased = Json::array();
  for (const FixedEffect& f : fit.fixef) {
    all.push_back(f.name);
    if (f.aliased) {
      aliased.push_back({{"name", f.name}, {"estimate", nullptr}, {"aliased", true}, {"dependence", f.dependence}});
    } else {
      kept.push_back({{"name", f.name},
                      {"estimate", number(f.estimate)},
                      {"se", number(f.se)},
                      {"t", number(f.t)},
                      {"df_satterthwaite", number(f.df)}});
    }
  }
  const std::size_t rank = kept.size();
  out["fixed_columns"] = std::move(all);
  out["fixef"] = std::move(kept);
  out["aliased"] = std::move(aliased);
  out["vcov_fixef"] = fit.vcov_fixef.size() == rank * rank ? matrix(fit.vcov_fixef, rank) : Json();
}

double sum_of_squares(const std::vector<double>& values) {
  return std::inner_product(values.begin(), values.end(), values.begin(), 0.0);
}

Json random_effects(const Fit& fit) {
  Json out = Json::array();
  for (const RandomEffects& r : fit.ranef) {
    Json effects{{"group", r.group},
                 {"term", r.term},
                 {"nlevels", r.levels.size()},
                 {"shown", "all"},
                 {"levels", r.levels},
                 {"estimate", numbers(r.estimate)},
                 {"cond_sd", numbers(r.cond_sd)},
                 {"pev_sd", numbers(r.pev_sd)}};
    if (!r.reliability.empty()) effects["reliability"] = numbers(r.reliability);
    effects["sum"] = number(std::accumulate(r.estimate.begin(), r.estimate.end(), 0.0));
    effects["sum_of_squares"] = number(sum_of_squares(r.estimate));
    if (!r.pev_sd.empty()) effects["sum_pev"] = number(sum_of_squares(r.pev_sd));
    out.push_back(std::move(effects));
  }
  return out;
}

Json contrasts(const Fit& fit) {
  Json out = Json::array();
  for (const Contrast& c : fit.contrasts) {
    const auto if_estimable = [&](const Json& value) { return c.estimable ? value : Json(); };
    Json contrast{{"name", c.name},
                  {"cells", Json::array()},
                  {"L", numbers(c.l)},
                  {"estimable", c.estimable},
                  {"estimate", if_estimable(number(c.estimate))},
                  {"se", if_estimable(number(c.se))},
                  {"df", if_estimable(number(c.df))},
                  {"t", if_estimable(number(c.t))}};
    if (!c.estimable) contrast["reason"] = c.reason;
    out.push_back(std::move(contrast));
  }
  return out;
}

Json ratios(const Fit& fit) {
  Json out = Json::array();
  for (const Ratio& r : fit.ratios) {
    out.push_back({{"name", r.name}, {"estimate", number(r.estimate)}, {"se_delta", number(r.se_delta)}});
  }
  return out;
}

Json iterations(const Fit& fit) {
  Json out = Json::array();
  for (const Iteration& i : fit.iterations) {
    out.push_back({{"criterion", number(i.criterion)}, {"score", number(i.score)}, {"step", number(i.step)}});
  }
  return out;
}

Json equations(const Fit& fit) {
  return {{"order", fit.equations.order},
          {"entries", fit.equations.entries},
          {"factor_entries", fit.equations.factor_entries},
          {"flops", number(fit.equations.flops)},
          {"bytes", number(fit.equations.bytes)},
          {"rank", fit.rank_equations},
          {"log_det", number(fit.log_det_equations)}};
}

const char* convergence_text(const Fit& fit) {
  if (fit.variances_given) return "variances_given";
  switch (fit.convergence) {
    case Convergence::converged:
      return "converged";
    case Convergence::stopped:
      return "stopped";
    case Convergence::not_converged:
      break;
  }
  return "not_converged";
}

Json fit_object(const Model& model, const Fit& fit) {
  Json out{{"schema", kFitSchema}, {"formula", model.formula}, {"response", model.response}};
  out["method"] = fit.reml ? "REML" : "ML";
  out["convergence"] = convergence_text(fit);
  out["optimizer"] = name(fit.optimizer);
  out["messages"] = fit.messages;
  out["observations"] = fit.observations;
  out["rows_dropped"] = model.rows_dropped;
  out["random"] = random_terms(model);
  out["criterion"] = number(fit.criterion);
  out["loglik"] = number(fit.loglik);
  out["n_par"] = fit.n_par;
  out["AIC"] = number(fit.aic);
  out["BIC"] = number(fit.bic);
  out["df_residual"] = fit.df_residual;
  out["sigma"] = number(fit.sigma);
  out["singular"] = fit.singular;
  out["theta"] = numbers(fit.theta);
  out["varcomp"] = variances(fit);
  out["information"] = information(fit);
  out["ratios"] = ratios(fit);
  add_fixed(out, fit);
  out["contrasts"] = contrasts(fit);
  out["yPy"] = number(fit.ypy);
  out["equations"] = equations(fit);
  out["iterations"] = iterations(fit);
  out["seconds"] = number(fit.seconds);
  out["peak_bytes"] = number(fit.peak_bytes);
  out["ranef"] = random_effects(fit);
  return out;
}

bool is_scalar(const Json& json) { return !json.is_structured(); }

std::string scalar_text(const Json& json) { return json.dump(-1, ' ', false, Json::error_handler_t::replace); }

// Objects over several lines, lists of scalars and objects of few scalars on one: a vector is a line, not a page.
void append(std::string& out, const Json& json, std::size_t indent) {
  constexpr std::size_t kShort = 8;
  if (is_scalar(json)) {
    out += scalar_text(json);
    return;
  }
  const bool flat = std::all_of(json.begin(), json.end(), is_scalar) && (json.is_array() || json.size() <= kShort);
  const auto begin_line = [&](std::size_t spaces) {
    if (!flat) out.append("\n").append(spaces, ' ');
  };
  out += json.is_array() ? '[' : '{';
  for (auto item = json.begin(); item != json.end(); ++item) {
    if (item != json.begin()) out += flat ? ", " : ",";
    begin_line(indent + 2);
    if (json.is_object()) out.append(scalar_text(item.key())).append(": ");
    append(out, *item, indent + 2);
  }
  begin_line(indent);
  out += json.is_array() ? ']' : '}';
}

// Every place that is wrong is reported through this: `where` in the words of the schema.
[[noreturn]] void refuse(const std::string& file, const std::string& where, const std::string& what,
                         const std::string& expected, const std::string& advice) {
  throw ModelError({.file = file, .variable = where, .what = what, .expected = expected, .advice = advice});
}

constexpr const char* kGiveAFit = "give the fit.json that an earlier fit of this model wrote with --out";

Json parsed(std::string_view text, const std::string& file) {
  try {
    return Json::parse(text);
  } catch (const Json::parse_error& error) {
    const std::string_view before = text.substr(0, error.byte > 0 ? error.byte - 1 : 0);
    const std::size_t line_start = before.rfind('\n');  // npos + 1 is 0
    throw ModelError({.file = file,
                      .line = std::count(before.begin(), before.end(), '\n') + 1,
                      .column = static_cast<std::int64_t>(before.size() - (line_start + 1)) + 1,
                      .what = "is not JSON from here on",
                      .expected = "a fit of schema qxsm-fit/1",
                      .advice = kGiveAFit});
  }
}

StartValues start_values(std::string_view text, const std::string& file) {
  const Json json = parsed(text, file);
  const auto schema = json.is_object() ? json.find("schema") : json.end();
  if (schema == json.end() || *schema != kFitSchema) {
    refuse(file, "schema", "found " + (schema == json.end() ? "none" : scalar_text(*schema)), "\"qxsm-fit/1\"",
           kGiveAFit);
  }
  StartValues start;
  try {
    std::size_t parameters = 0;
    for (const Json& term : json.at("random")) {
      start.terms.push_back({.group = term.at("group"), .coefs = term.at("terms")});
      const std::size_t count = start.terms.back().coefs.size();
      parameters += count * (count + 1) / 2;
    }
    start.theta = json.at("theta").get<std::vector<double>>();
    if (start.theta.size() == parameters) return start;
  } catch (const Json::exception&) {
    refuse(file, "theta", "cannot be read, or its terms under \"random\" cannot", "numbers for every term", kGiveAFit);
  }
  refuse(file, "theta", "found " + std::to_string(start.theta.size()) + " numbers", "those of its terms", kGiveAFit);
}

std::string described(const std::string& group, const std::vector<std::string>& coefs) {
  std::string text;
  for (const std::string& coef : coefs) text += (text.empty() ? "(" : " + ") + coef;
  return text + " | " + group + ")";
}

}  // namespace

std::string fit_json(const Model& model, const Fit& fit) {
  std::string out;
  append(out, fit_object(model, fit), 0);
  return out + "\n";
}

std::optional<StartValues> read_start(std::string_view text) {
  try {
    return start_values(text, "");
  } catch (const ModelError&) {
    return std::nullopt;
  }
}

std::vector<double> start_theta(std::string_view text, const Model& model, const std::string& file) {
  const StartValues start = start_values(text, file);
  std::vector<double> theta;
  std::vector<bool> used(start.terms.size(), false);
  for (const RandomTerm& term : model.random) {
    std::size_t place = 0;
    std::size_t i = 0;
    const auto size = [](const StartValues::Term& t) { return t.coefs.size() * (t.coefs.size() + 1) / 2; };
    while (i < start.terms.size() &&
           (used[i] || start.terms[i].group != term.group || start.terms[i].coefs != term.coefs)) {
      place += size(start.terms[i++]);
    }
    if (i == start.terms.size()) {
      refuse(file, described(term.group, term.coefs), "this term of the model is not in the earlier fit",
             "the same random effects", "start without --start, or from a fit of this formula");
    }
    used[i] = true;
    const auto from = start.theta.begin() + static_cast<std::ptrdiff_t>(place);
    theta.insert(theta.end(), from, from + static_cast<std::ptrdiff_t>(size(start.terms[i])));
  }
  const auto unused = std::find(used.begin(), used.end(), false);
  if (unused != used.end()) {
    const StartValues::Term& term = start.terms[static_cast<std::size_t>(unused - used.begin())];
    refuse(file, described(term.group, term.coefs), "this term of the earlier fit is not in the model",
           "the same random effects", "start without --start, or from a fit of this formula");
  }
  return theta;
}

}  // namespace sm::mixed
