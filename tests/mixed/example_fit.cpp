#include "mixed/example_fit.hpp"

#include <cmath>
#include <limits>
#include <random>

namespace sm::mixed::test {
namespace {

FixedEffect kept(const std::string& name, double estimate, double se, std::optional<double> df, double t) {
  FixedEffect effect;
  effect.name = name;
  effect.estimate = estimate;
  effect.se = se;
  effect.df = df;
  effect.t = t;
  return effect;
}

VarianceComponent component(const std::string& group, const std::string& var1, const std::string& var2, double vcov,
                            double sdcor, double se) {
  VarianceComponent c;
  c.group = group;
  c.var1 = var1;
  c.var2 = var2;
  c.vcov = vcov;
  c.sdcor = sdcor;
  c.se_observed = se;
  return c;
}

RandomTerm term_of(const std::string& group, const std::vector<std::string>& coefs,
                   const std::vector<std::string>& levels) {
  RandomTerm term;
  term.group = group;
  term.coefs = coefs;
  term.levels = levels;
  return term;
}

void add_fixed(Example& e) {
  e.model.fixed.names = {"(Intercept)", "x", "fb", "fc"};
  e.model.fixed.kept = {0, 1, 2};
  e.model.fixed.aliased = {3};
  FixedEffect aliased;
  aliased.name = "fc";
  aliased.aliased = true;
  aliased.dependence = "fc = (Intercept) - fb";
  e.fit.fixef = {kept("(Intercept)", 251.4051, 6.82456, 17.0, 36.83831), kept("x", 10.46729, 1.54579, 17.0, 6.771485),
                 kept("fb", -0.25, 2.5, std::nullopt, -0.1), aliased};
  e.fit.vcov_fixef = {4.0, -1.0, 0.0, -1.0, 1.0, 0.5, 0.0, 0.5, 4.0};
  Contrast estimable{"1*f[b] - 1*f[a]", {0.0, 0.0, 1.0, 0.0}, true, "", -0.25, 2.5, 12.25, -0.1};
  Contrast not_estimable{"1*f[c]", {0.0, 0.0, 0.0, 1.0}, false, "it needs 'fc' alone", 0.0, 0.0, std::nullopt, 0.0};
  e.fit.contrasts = {estimable, not_estimable};
}

void add_random(Example& e) {
  e.model.random = {term_of("g", {"(Intercept)", "x"}, {"u", "v", "w"})};
  e.fit.varcomp = {component("g", "(Intercept)", "", 612.0, 24.7386, 288.75),
                   component("g", "(Intercept)", "x", 9.5, 0.0655, 46.75),
                   component("g", "x", "", 35.0, 5.91608, 14.75), component("Residual", "", "", 654.0, 25.5734, 77.25)};
  e.fit.varcomp[0].se_average = 288.5;
  e.fit.free = {0, 2};
  e.fit.information_observed = {4.0, 1.0, 2.0, 8.0};
  e.fit.information_average = {4.0, 1.5, 1.5, 8.0};
  e.fit.theta = {0.966, 0.015, 0.231};
  for (const char* name : {"(Intercept)", "x"}) {
    e.fit.ranef.push_back({.group = "g",
                           .term = name,
                           .levels = e.model.random[0].levels,
                           .estimate = {2.25, -40.5, 38.25},
                           .cond_sd = {12.0, 12.5, 13.0},
                           .pev_sd = {13.0, 13.5, 14.0},
                           .reliability = {}});
  }
}

}  // namespace

Example example_fit() {
  Example e;
  e.model.formula = "y ~ x + f + (x | g)";
  e.model.response = "y";
  e.model.y = {1.0, 2.0, 4.0, 8.0};
  e.model.row = {0, 1, 3, 4};
  e.model.rows_dropped = 1;
  add_fixed(e);
  add_random(e);
  Fit& fit = e.fit;
  fit.convergence = Convergence::converged;
  fit.optimizer = "trust-region Newton";
  fit.iterations = {{100.0, 12.0, 0.0}, {60.0, 0.5, 1.5}, {51.0, 1e-3, 0.25}, {50.5, 2.5e-11, 0.01}};
  fit.criterion = 50.5;
  fit.loglik = -25.25;
  fit.n_par = 7;
  fit.aic = 64.5;
  fit.bic = 66.25;
  fit.observations = 4;
  fit.df_residual = -3;
  fit.sigma = 25.5734;
  fit.ratios = {{.name = "g / total", .estimate = 0.48, .se_delta = 0.125}};
  fit.residuals = {25.5734, -25.5734, 51.1468, 0.0};
  for (std::size_t i = 0; i < fit.residuals.size(); ++i) fit.fitted.push_back(e.model.y[i] - fit.residuals[i]);
  fit.equations = {.order = 10, .entries = 30, .factor_entries = 33, .flops = 250.0, .bytes = 4096.0};
  fit.rank_equations = 9;
  fit.log_det_equations = 12.5;
  fit.spy_equations = {.order = 3, .entries = 4, .places = {{0, 0}, {0, 2}, {1, 1}, {2, 2}}};
  fit.spy_factor = {.order = 3, .entries = 5, .places = {{0, 0}, {0, 2}, {1, 1}, {1, 2}, {2, 2}}};
  return e;
}

Example drawn_fit(std::size_t levels, std::size_t observations) {
  Example e;
  std::mt19937 random(20260101);
  std::normal_distribution<double> normal;
  e.model.formula = "y ~ 1 + (1 | g)";
  e.model.response = "y";
  RandomTerm term = term_of("g", {"(Intercept)"}, {});
  RandomEffects effects;
  effects.group = "g";
  effects.term = "(Intercept)";
  for (std::size_t i = 0; i < levels; ++i) {
    term.levels.push_back("level " + std::to_string(i + 1));
    effects.estimate.push_back(3.0 * normal(random));
    effects.cond_sd.push_back(0.5);
    effects.pev_sd.push_back(0.75);
  }
  effects.levels = term.levels;
  e.model.random = {term};
  Fit& fit = e.fit;
  fit.ranef = {effects};
  fit.convergence = Convergence::converged;
  fit.sigma = 2.0;
  fit.observations = static_cast<std::int64_t>(observations);
  for (std::size_t i = 0; i < observations; ++i) {
    fit.fitted.push_back(100.0 + 10.0 * normal(random));
    fit.residuals.push_back(2.0 * normal(random));
    e.model.y.push_back(fit.fitted[i] + fit.residuals[i]);
    e.model.row.push_back(static_cast<std::int64_t>(i));
  }
  fit.varcomp = {component("g", "(Intercept)", "", 9.0, 3.0, 1.0), component("Residual", "", "", 4.0, 2.0, 0.5)};
  fit.fixef = {kept("(Intercept)", 100.0, 1.0, 5.0, 100.0)};
  fit.vcov_fixef = {1.0};
  return e;
}

std::vector<std::string> hostile_names() {
  return {"he said \"no\"",
          "a,b;c\td",
          "<script>alert('&amp;')</script>",
          "two\nlines\r\n",
          std::string("bell\x07 and nul\0!", 15),
          "not UTF-8: \xff\xfe\xc3",
          "Größe µ",
          "\xE6\xB8\xA9\xE5\xBA\xA6",   // two wide characters
          "e\xCC\x81\xF0\x9F\x8C\xB1",  // e with a combining accent, a seedling
          "]]>--><!--",
          "",
          std::string(3000, 'w')};
}

}  // namespace sm::mixed::test
