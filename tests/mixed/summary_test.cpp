#include "mixed/summary.hpp"

#include <gtest/gtest.h>

#include <cmath>
#include <limits>

#include "mixed/example_fit.hpp"
#include "mixed/text.hpp"

namespace sm::mixed::test {
namespace {

bool has(const std::string& text, const std::string& part) { return text.find(part) != std::string::npos; }

TEST(Summary, reads_as_a_whole) {
  const Example e = example_fit();
  SummaryOptions options;
  options.data = "y.csv";
  options.references = {{.factor = "f", .level = "a"}};
  EXPECT_EQ(summary(e.model, e.fit, options),
            R"(Linear mixed model fit by REML
Formula: y ~ x + f + (x | g)
Data: y.csv

REML criterion at convergence: 50.5000
    AIC      BIC    logLik  parameters  df.resid
64.5000  66.2500  -25.2500           7        -3
Converged: trust-region Newton, 3 iterations, largest scaled score 2.5e-11

Scaled residuals:
    Min       1Q  Median      3Q     Max
-1.0000  -0.2500  0.5000  1.2500  2.0000

Random effects:
 Group     Term         Variance  Std. Error  Std. Dev.  Corr.
 g         (Intercept)  612.0000    288.7500   24.73860
           x             35.0000     14.7500    5.91608  0.066
 Residual               654.0000     77.2500   25.57340
Observations: 4; levels: g 3
1 row was left out for missing values
Mixed-model equations: order 10, 30 entries, 33 in the factor

Fixed effects:
             Estimate  Std. Error     df  t value  Pr(>|t|)
(Intercept)  251.4051      6.8246  17.00   36.838   < 2e-16
x             10.4673      1.5458  17.00    6.771  3.26e-06
fb            -0.2500      2.5000      —   -0.100         —
fc                  —           —      —        —         —
Reference levels: f a
Aliased, without an estimate of their own (—), as columns of the design:
  fc = (Intercept) - fb

Correlation of fixed effects:
    (Intr)      x
x   -0.500
fb   0.000  0.250

Contrasts:
                 Estimate  Std. Error     df  t value  Pr(>|t|)
1*f[b] - 1*f[a]   -0.2500      2.5000  12.25   -0.100    0.9220      estimable
1*f[c]                  —           —      —        —         —  not estimable
  1*f[c] is not estimable: it needs 'fc' alone

Ratios of variances:
           Estimate  Std. Error
g / total    0.4800      0.1250
)");
}

TEST(Summary, says_how_a_fit_ended) {
  Example e = example_fit();
  e.fit.reml = false;
  EXPECT_TRUE(has(summary(e.model, e.fit), "fit by maximum likelihood\n"));
  EXPECT_TRUE(has(summary(e.model, e.fit), "\n-2 log likelihood at convergence: 50.5000\n"));
  e.fit.convergence = Convergence::not_converged;
  EXPECT_TRUE(has(summary(e.model, e.fit), "\nNOT CONVERGED: trust-region Newton, 3 iterations"));
  EXPECT_TRUE(has(summary(e.model, e.fit), "-2 log likelihood where it stands: 50.5000\n"));
  EXPECT_FALSE(has(summary(e.model, e.fit), "Converged"));
  e.fit.convergence = Convergence::stopped;
  EXPECT_TRUE(has(summary(e.model, e.fit), "\nSTOPPED on request before it converged: trust-region Newton"));
  EXPECT_FALSE(has(summary(e.model, e.fit), "NOT CONVERGED"));
}

TEST(Summary, of_given_variances_claims_no_estimate_of_them) {
  Example e = example_fit();
  e.fit.variances_given = true;
  e.fit.iterations.clear();
  const std::string text = summary(e.model, e.fit);
  EXPECT_TRUE(has(text, "Linear mixed model with given variances\n"));
  EXPECT_TRUE(has(text, "\nREML criterion at these variances: 50.5000\nThe variances are given:"));
  EXPECT_TRUE(has(text,
                  "\nRandom effects (variances given):\n"
                  " Group     Term         Variance  Std. Dev.  Corr.\n"));
  EXPECT_TRUE(has(text, "rank 9, log-determinant 12.5"));
  e.fit.criterion = std::nan("");
  EXPECT_FALSE(has(summary(e.model, e.fit), "criterion"));
}

TEST(Summary, names_the_term_on_the_boundary) {
  Example e = example_fit();
  e.fit.singular = true;
  e.fit.varcomp[2].vcov = 0.0;
  e.fit.varcomp[2].se_observed.reset();
  e.fit.varcomp[1].sdcor = std::nan("");
  EXPECT_TRUE(has(summary(e.model, e.fit),
                  "\nNotes:\n- The variance of g x is estimated as zero, on the boundary of what it can be.\n"));
  EXPECT_TRUE(has(summary(e.model, e.fit), "\n           x                   0           —"));
  e.fit.messages = {"the variance of g x is on the boundary"};
  EXPECT_TRUE(has(summary(e.model, e.fit), "\nNotes:\n- the variance of g x is on the boundary\n"));
  EXPECT_FALSE(has(summary(e.model, e.fit), "The variance"));
}

TEST(Summary, names_a_correlation_of_one) {
  Example e = example_fit();
  e.fit.singular = true;
  e.fit.varcomp[1].sdcor = -1.0;
  EXPECT_TRUE(
      has(summary(e.model, e.fit), "- The correlation of g (Intercept), x is estimated as -1, on the boundary"));
}

TEST(Summary, weighs_the_scaled_residuals) {
  Example e = example_fit();
  e.model.weights = {4.0, 1.0, 1.0, 1.0};
  EXPECT_TRUE(has(summary(e.model, e.fit), "\n-1.0000  -0.2500  1.0000  2.0000  2.0000\n"));
}

TEST(Summary, counts_a_grouping_factor_of_several_terms_once) {
  Example e = example_fit();
  e.model.random.push_back(e.model.random[0]);
  RandomTerm other = e.model.random[0];
  other.group = "h";
  e.model.random.push_back(other);
  EXPECT_TRUE(has(summary(e.model, e.fit), "\nObservations: 4; levels: g 3, h 3\n"));
}

TEST(Summary, names_a_known_precision_and_the_variables_with_missing_values) {
  Example e = example_fit();
  e.model.random.push_back(e.model.random[0]);
  e.model.random[0].known = "pedigree";
  e.model.rows_dropped = 3;
  e.model.missing = {{"x", 2}, {"y", 1}};
  EXPECT_TRUE(has(summary(e.model, e.fit),
                  "\nObservations: 4; levels: g 3 (with pedigree), g 3\n"
                  "3 rows were left out for missing values (x 2, y 1)\n"));
}

TEST(Summary, numbers_the_correlations_of_names_that_begin_alike) {
  Example e = example_fit();
  e.fit.fixef[1].name = "Variety of oats 1";
  e.fit.fixef[2].name = "Variety of oats 2";
  EXPECT_TRUE(has(summary(e.model, e.fit),
                  "                           [1]    [2]\n"
                  " [1] (Intercept)\n"
                  " [2] Variety of oats 1  -0.500\n"
                  " [3] Variety of oats 2   0.000  0.250\n"));
  EXPECT_FALSE(has(summary(e.model, e.fit, {.data = "", .references = {}, .most_correlations = 2}), "Correlation"));
}

TEST(Summary, shows_hostile_names_in_lines_of_bounded_width) {
  constexpr std::size_t kWidest = 100;
  Example e = example_fit();
  for (const std::string& name : hostile_names()) {
    e.fit.fixef[1].name = "x" + name;
    e.fit.contrasts[0].name = name;
    e.fit.varcomp[0].group = e.fit.varcomp[1].group = e.fit.varcomp[2].group = name;
    std::string_view rest = e.model.formula;
    const std::string text = summary(e.model, e.fit);
    for (rest = text; !rest.empty();) {
      const std::size_t end = rest.find('\n');
      ASSERT_NE(end, std::string_view::npos);
      EXPECT_LE(cells(rest.substr(0, end)), kWidest) << rest.substr(0, end);
      EXPECT_EQ(printable(rest.substr(0, end)), rest.substr(0, end));
      rest.remove_prefix(end + 1);
    }
  }
}

TEST(Summary, of_an_empty_fit_has_no_tables_of_nothing) {
  const std::string text = summary(Model{}, Fit{});
  EXPECT_TRUE(has(text, "NOT CONVERGED: 0 iterations"));
  EXPECT_TRUE(has(text, "No fixed effects\n"));
  for (const char* absent : {"Contrasts", "Ratios", "Random effects", "Correlation", "Notes", "Scaled residuals"}) {
    EXPECT_FALSE(has(text, absent)) << absent;
  }
}

}  // namespace
}  // namespace sm::mixed::test
